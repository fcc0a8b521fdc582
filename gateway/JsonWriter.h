#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "lang/Variant.h"
#include "platform/Clock.h"

namespace maroset::gateway {

// Builds one compact JSON text (no blanks), keys in the order they are written.
//
// Text is bytes, read as Latin-1: quote, backslash and the short control escapes are written
// as \" \\ \n \r \t \b \f, every other byte below 0x20 and every byte from 0x7F up as \u00XX,
// so the output is plain ASCII whatever the bytes.
//
//     JsonWriter j;
//     j.beginObject().key("reply").string("write").key("ok").boolean(true).endObject();
//     j.str();  // {"reply":"write","ok":true}
class JsonWriter {
  public:
    JsonWriter& beginObject();
    JsonWriter& endObject();
    JsonWriter& beginArray();
    JsonWriter& endArray();
    JsonWriter& key(std::string_view name);

    JsonWriter& string(std::string_view bytes);
    JsonWriter& integer(int64_t value);
    JsonWriter& boolean(bool value);
    JsonWriter& null();
    // Numbers as CStr prints them (12.5, 1E+20), Booleans as true/false, text as a string,
    // Empty and Null as null, arrays element by element, objects by their default value.
    JsonWriter& value(const Variant& v);
    // A value already written as JSON (by Quote, Number or another writer), as it is.
    JsonWriter& raw(std::string_view json);
    // A date and time in ISO 8601, local time to the millisecond: "2026-03-07T09:00:00.000".
    JsonWriter& time(platform::DateTime t);

    const std::string& str() const { return out_; }

    // The JSON string literal of bytes, quotes included.
    static std::string Quote(std::string_view bytes);
    // A number's JSON text as CStr writes it; "null" for a value that is not finite.
    static std::string Number(const Variant& number);

  private:
    void separate();
    // Quote's text, appended to out.
    static void AppendQuoted(std::string& out, std::string_view bytes);

    std::string out_;
    // One entry per open object or array: true until its first member is written.
    std::vector<bool> first_;
    bool afterKey_ = false;
};

}  // namespace maroset::gateway
