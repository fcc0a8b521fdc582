#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace maroset::cli {

// The options and operands of one subcommand. Options are "--name value", "--name=value" or
// plain flags, in any order among the operands; "--" ends the options. "--help" (or "-h")
// anywhere asks for help, whatever else is wrong with the line. Everything else that is
// wrong is a UsageError.
class CommandLine {
  public:
    struct Option {
        std::string name;  // without the dashes
        bool takesValue = false;
        bool repeatable = false;
    };

    explicit CommandLine(std::vector<Option> options);

    void parse(const std::vector<std::string>& args);

    bool help() const { return help_; }
    const std::vector<std::string>& operands() const { return operands_; }
    bool has(const std::string& name) const;
    // The value of an option (the last one when it was given more than once).
    std::optional<std::string> value(const std::string& name) const;
    std::vector<std::string> values(const std::string& name) const;

    // Requires between min and max operands (UsageError otherwise).
    void requireOperands(size_t min, size_t max) const;
    // The option's value as an integer in [min, max] (UsageError otherwise).
    std::optional<int32_t> integer(const std::string& name, int32_t min, int32_t max) const;

    // Decimal integer text, with an optional sign; nothing when it is not one or out of range.
    static std::optional<int32_t> ParseInteger(const std::string& text);

  private:
    const Option* find(const std::string& name) const;

    std::vector<Option> options_;
    std::map<std::string, std::vector<std::string>> given_;
    std::vector<std::string> operands_;
    bool help_ = false;
};

}  // namespace maroset::cli
