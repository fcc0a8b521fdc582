#pragma once

#include <cstdint>
#include <iosfwd>
#include <memory>
#include <string>
#include <string_view>
#include <variant>

#include "lang/Object.h"
#include "lang/VbArray.h"

namespace maroset {

// The kinds a Variant holds, numbered as the language's VarType numbers them.
enum class VarType : uint16_t {
    Empty = 0,
    Null = 1,
    Integer = 2,  // 16-bit
    Long = 3,     // 32-bit
    Single = 4,
    Double = 5,
    Date = 7,    // days since 12/30/1899, the time of day as the fraction
    String = 8,  // bytes, Latin-1
    Object = 9,
    Boolean = 11,
    Array = 8204,  // array of Variant
};

// The dynamically typed value that crosses every interface of the system: tag values, node
// properties, database fields. Conversions with the language's rules live in Conversions.h;
// the accessors here return the held value of exactly one kind and fail with Type mismatch
// (13) for any other.
//
// A Variant holding an array has value semantics: copies share storage until one of them
// is changed through array().
class Variant {
  public:
    Variant() noexcept = default;
    Variant(int16_t v) noexcept : value_(v) {}
    Variant(int32_t v) noexcept : value_(v) {}
    Variant(float v) noexcept : value_(v) {}
    Variant(double v) noexcept : value_(v) {}
    Variant(bool v) noexcept : value_(v) {}
    Variant(std::string v) noexcept : value_(std::move(v)) {}
    Variant(std::string_view v) : value_(std::string(v)) {}
    Variant(const char* v) : value_(std::string(v)) {}
    Variant(VbArray<Variant> v) : value_(std::make_shared<VbArray<Variant>>(std::move(v))) {}
    Variant(std::shared_ptr<Object> v) noexcept : value_(std::move(v)) {}

    static Variant Null() noexcept;
    // A Date: days since 12/30/1899 (the language's date serial), the time of day as the
    // fraction; before that day the whole days count down and the fraction still counts up.
    static Variant FromDate(double days) noexcept;

    VarType type() const noexcept;
    // The language's TypeName: "Empty", "Null", "Integer", "Long", "Single", "Double",
    // "Date", "String", "Boolean", "Variant()", or "Object".
    std::string typeName() const;

    bool isEmpty() const noexcept { return value_.index() == 0; }
    bool isNull() const noexcept { return value_.index() == 1; }
    bool isString() const noexcept { return std::holds_alternative<std::string>(value_); }
    bool isArray() const noexcept;
    bool isObject() const noexcept;
    // Integer, Long, Single, Double or Boolean.
    bool isNumber() const noexcept;

    int16_t integer() const;
    int32_t lng() const;
    float single() const;
    double dbl() const;
    // The date serial of a Date.
    double date() const;
    bool boolean() const;
    const std::string& string() const;
    const VbArray<Variant>& array() const;
    VbArray<Variant>& array();
    const std::shared_ptr<Object>& object() const;

    // Same kind and same value (arrays element by element). This is identity, for tests and
    // containers; the language's comparison with its coercions is Compare() in Conversions.h.
    friend bool operator==(const Variant& a, const Variant& b);

  private:
    struct NullValue {
        friend bool operator==(NullValue, NullValue) { return true; }
    };
    struct DateValue {
        double days;
        friend bool operator==(DateValue, DateValue) = default;
    };
    using Storage =
        std::variant<std::monostate, NullValue, int16_t, int32_t, float, double, std::string, bool,
                     std::shared_ptr<VbArray<Variant>>, std::shared_ptr<Object>, DateValue>;
    Storage value_;
};

// Prints the kind and value, so failing test assertions read well.
void PrintTo(const Variant& v, std::ostream* os);

}  // namespace maroset
