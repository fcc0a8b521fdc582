#include "cli/CommandLine.h"

#include <charconv>
#include <limits>

#include "cli/UsageError.h"

namespace maroset::cli {

CommandLine::CommandLine(std::vector<Option> options) : options_(std::move(options)) {}

const CommandLine::Option* CommandLine::find(const std::string& name) const {
    for (const auto& option : options_) {
        if (option.name == name) return &option;
    }
    return nullptr;
}

void CommandLine::parse(const std::vector<std::string>& args) {
    // Help wins over any other mistake on the line.
    for (const auto& arg : args) {
        if (arg == "--") break;
        if (arg == "--help" || arg == "-h") {
            help_ = true;
            return;
        }
    }
    bool optionsEnded = false;
    for (size_t i = 0; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (optionsEnded || arg.size() < 2 || arg[0] != '-') {
            operands_.push_back(arg);
            continue;
        }
        if (arg == "--") {
            optionsEnded = true;
            continue;
        }
        if (arg.rfind("--", 0) != 0) throw UsageError("unknown option '" + arg + "'");
        std::string name = arg.substr(2);
        std::optional<std::string> inlineValue;
        if (const auto eq = name.find('='); eq != std::string::npos) {
            inlineValue = name.substr(eq + 1);
            name.resize(eq);
        }
        const Option* option = find(name);
        if (!option) throw UsageError("unknown option '--" + name + "'");
        if (!option->takesValue) {
            if (inlineValue) throw UsageError("option '--" + name + "' takes no value");
            given_[name].emplace_back();
            continue;
        }
        std::string value;
        if (inlineValue) {
            value = *inlineValue;
        } else if (i + 1 < args.size()) {
            value = args[++i];
        } else {
            throw UsageError("option '--" + name + "' needs a value");
        }
        auto& values = given_[name];
        if (!option->repeatable) values.clear();  // the last one counts
        values.push_back(std::move(value));
    }
}

bool CommandLine::has(const std::string& name) const {
    return given_.count(name) != 0;
}

std::optional<std::string> CommandLine::value(const std::string& name) const {
    const auto it = given_.find(name);
    if (it == given_.end() || it->second.empty()) return std::nullopt;
    return it->second.back();
}

std::vector<std::string> CommandLine::values(const std::string& name) const {
    const auto it = given_.find(name);
    return it == given_.end() ? std::vector<std::string>{} : it->second;
}

void CommandLine::requireOperands(size_t min, size_t max) const {
    if (operands_.size() < min) throw UsageError("missing operand");
    if (operands_.size() > max) throw UsageError("unexpected operand '" + operands_[max] + "'");
}

std::optional<int32_t> CommandLine::integer(const std::string& name, int32_t min,
                                            int32_t max) const {
    const auto text = value(name);
    if (!text) return std::nullopt;
    const auto number = ParseInteger(*text);
    if (!number || *number < min || *number > max) {
        throw UsageError("option '--" + name + "' needs a whole number from " +
                         std::to_string(min) + " to " + std::to_string(max) + ", not '" + *text +
                         "'");
    }
    return number;
}

std::optional<int32_t> CommandLine::ParseInteger(const std::string& text) {
    const char* first = text.data();
    const char* last = first + text.size();
    if (first != last && *first == '+') {
        ++first;
        if (first != last && *first == '-') return std::nullopt;
    }
    if (first == last) return std::nullopt;
    int64_t value = 0;
    const auto [end, ec] = std::from_chars(first, last, value);
    if (ec != std::errc() || end != last) return std::nullopt;
    if (value < std::numeric_limits<int32_t>::min() || value > std::numeric_limits<int32_t>::max())
        return std::nullopt;
    return static_cast<int32_t>(value);
}

}  // namespace maroset::cli
