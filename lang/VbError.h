#pragma once

#include <cstdint>
#include <exception>
#include <string>

namespace maroset {

// Run-time error numbers of the language the system's behaviour comes from. Hosts see the
// number and description of a VbError that leaves the library as an automation error.
namespace err {
inline constexpr int32_t InvalidProcedureCall = 5;
inline constexpr int32_t Overflow = 6;
inline constexpr int32_t SubscriptOutOfRange = 9;
inline constexpr int32_t TypeMismatch = 13;
inline constexpr int32_t BadFileNameOrNumber = 52;
inline constexpr int32_t FileNotFound = 53;
inline constexpr int32_t PathFileAccess = 75;
inline constexpr int32_t PathNotFound = 76;
inline constexpr int32_t ObjectNotSet = 91;
inline constexpr int32_t InvalidUseOfNull = 94;
inline constexpr int32_t InvalidPropertyValue = 380;
inline constexpr int32_t SetNotSupportedAtRunTime = 382;
inline constexpr int32_t SetNotPermitted = 387;
inline constexpr int32_t NotSupported = 438;
inline constexpr int32_t DuplicateKey = 457;
// Database engine errors.
inline constexpr int32_t NoCurrentRecord = 3021;
inline constexpr int32_t CouldNotFindFile = 3024;
inline constexpr int32_t QuerySyntax = 3075;
inline constexpr int32_t TableNotFound = 3078;
inline constexpr int32_t CharactersAfterEnd = 3142;
inline constexpr int32_t DatabaseExists = 3204;
inline constexpr int32_t ItemNotFound = 3265;
inline constexpr int32_t UnrecognizedDatabase = 3343;
}  // namespace err

// The standard description of a run-time error number ("Type mismatch", "Overflow", ...);
// "Application-defined or object-defined error" for a number it does not know.
std::string ErrorDescription(int32_t number);

// A run-time error: number, source, description and line (always 0: no procedure of the
// system carries line numbers). The source is filled in by the first trapping procedure
// the error passes through when the thrower left it empty.
class VbError : public std::exception {
  public:
    explicit VbError(int32_t number, std::string description = {}, std::string source = {});

    int32_t number() const noexcept { return number_; }
    const std::string& description() const noexcept { return description_; }
    const std::string& source() const noexcept { return source_; }
    int32_t line() const noexcept { return 0; }
    void setSource(std::string source) { source_ = std::move(source); }

    const char* what() const noexcept override { return description_.c_str(); }

  private:
    int32_t number_;
    std::string description_;
    std::string source_;
};

}  // namespace maroset
