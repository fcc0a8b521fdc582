#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace maroset::gateway {

// One JSON value as JsonReader reads it. Text is kept as Latin-1 bytes, the way the library
// holds text; members keep their order, and a repeated name keeps every occurrence.
struct JsonValue {
    enum class Kind { Null, Boolean, Number, String, Array, Object };

    Kind kind = Kind::Null;
    bool boolean = false;
    double number = 0;
    bool integral = false;  // written without fraction or exponent, and fits 32 bits
    std::string text;
    std::vector<JsonValue> items;
    // An object's members: names[i] is the name of values[i]. (Two lists, not one of pairs:
    // a pair cannot hold the type it is part of.)
    std::vector<std::string> names;
    std::vector<JsonValue> values;

    // The last member named name; null when there is none (or this is not an object).
    const JsonValue* member(std::string_view name) const;
};

}  // namespace maroset::gateway
