#include "lang/Variant.h"

#include <cstdio>
#include <ostream>

#include "lang/Conversions.h"

namespace maroset {

namespace {
// Index of each kind in Variant's storage.
enum Index : size_t {
    kEmpty = 0,
    kNull,
    kInteger,
    kLong,
    kSingle,
    kDouble,
    kString,
    kBoolean,
    kArray,
    kObject,
    kDate
};

[[noreturn]] void typeMismatch() {
    throw VbError(err::TypeMismatch);
}
}  // namespace

Variant Variant::Null() noexcept {
    Variant v;
    v.value_.emplace<NullValue>();
    return v;
}

Variant Variant::FromDate(double days) noexcept {
    Variant v;
    v.value_.emplace<DateValue>(DateValue{days});
    return v;
}

VarType Variant::type() const noexcept {
    switch (value_.index()) {
        case kNull:
            return VarType::Null;
        case kInteger:
            return VarType::Integer;
        case kLong:
            return VarType::Long;
        case kSingle:
            return VarType::Single;
        case kDouble:
            return VarType::Double;
        case kDate:
            return VarType::Date;
        case kString:
            return VarType::String;
        case kBoolean:
            return VarType::Boolean;
        case kArray:
            return VarType::Array;
        case kObject:
            return VarType::Object;
        default:
            return VarType::Empty;
    }
}

std::string Variant::typeName() const {
    switch (value_.index()) {
        case kNull:
            return "Null";
        case kInteger:
            return "Integer";
        case kLong:
            return "Long";
        case kSingle:
            return "Single";
        case kDouble:
            return "Double";
        case kDate:
            return "Date";
        case kString:
            return "String";
        case kBoolean:
            return "Boolean";
        case kArray:
            return "Variant()";
        case kObject:
            return "Object";
        default:
            return "Empty";
    }
}

bool Variant::isArray() const noexcept {
    return value_.index() == kArray;
}
bool Variant::isObject() const noexcept {
    return value_.index() == kObject;
}
bool Variant::isNumber() const noexcept {
    const size_t i = value_.index();
    return i == kInteger || i == kLong || i == kSingle || i == kDouble || i == kBoolean;
}

int16_t Variant::integer() const {
    if (auto p = std::get_if<int16_t>(&value_)) return *p;
    typeMismatch();
}
int32_t Variant::lng() const {
    if (auto p = std::get_if<int32_t>(&value_)) return *p;
    typeMismatch();
}
float Variant::single() const {
    if (auto p = std::get_if<float>(&value_)) return *p;
    typeMismatch();
}
double Variant::dbl() const {
    if (auto p = std::get_if<double>(&value_)) return *p;
    typeMismatch();
}
double Variant::date() const {
    if (auto p = std::get_if<DateValue>(&value_)) return p->days;
    typeMismatch();
}
bool Variant::boolean() const {
    if (auto p = std::get_if<bool>(&value_)) return *p;
    typeMismatch();
}
const std::string& Variant::string() const {
    if (auto p = std::get_if<std::string>(&value_)) return *p;
    typeMismatch();
}
const VbArray<Variant>& Variant::array() const {
    if (auto p = std::get_if<std::shared_ptr<VbArray<Variant>>>(&value_)) return **p;
    typeMismatch();
}
VbArray<Variant>& Variant::array() {
    auto p = std::get_if<std::shared_ptr<VbArray<Variant>>>(&value_);
    if (!p) typeMismatch();
    // Copies share the storage; the first one changed gets its own.
    if (p->use_count() > 1) *p = std::make_shared<VbArray<Variant>>(**p);
    return **p;
}
const std::shared_ptr<Object>& Variant::object() const {
    if (auto p = std::get_if<std::shared_ptr<Object>>(&value_)) return *p;
    typeMismatch();
}

bool operator==(const Variant& a, const Variant& b) {
    if (a.value_.index() != b.value_.index()) return false;
    if (a.isArray()) {
        const auto& pa = std::get<kArray>(a.value_);
        const auto& pb = std::get<kArray>(b.value_);
        return pa == pb || *pa == *pb;
    }
    return a.value_ == b.value_;
}

void PrintTo(const Variant& v, std::ostream* os) {
    *os << v.typeName();
    switch (v.type()) {
        case VarType::Empty:
        case VarType::Null:
            return;
        case VarType::String: {
            *os << "(\"";
            for (unsigned char c : v.string()) {
                if (c == '"' || c == '\\') {
                    *os << '\\' << c;
                } else if (c < 0x20 || c >= 0x7f) {
                    char buf[8];
                    std::snprintf(buf, sizeof buf, "\\x%02X", c);
                    *os << buf;
                } else {
                    *os << c;
                }
            }
            *os << "\")";
            return;
        }
        case VarType::Array: {
            const auto& a = v.array();
            *os << "(" << a.LBound() << " To " << a.UBound() << ": ";
            bool first = true;
            for (const auto& item : a) {
                if (!first) *os << ", ";
                first = false;
                PrintTo(item, os);
            }
            *os << ")";
            return;
        }
        case VarType::Object:
            *os << "(" << v.object().get() << ")";
            return;
        default:
            *os << "(" << CStr(v) << ")";
            return;
    }
}

}  // namespace maroset
