#include "gateway/JsonWriter.h"

#include <cmath>
#include <cstdio>

#include "lang/Conversions.h"
#include "lang/Object.h"

namespace maroset::gateway {

void JsonWriter::separate() {
    if (afterKey_) {
        afterKey_ = false;
        return;
    }
    if (!first_.empty()) {
        if (!first_.back()) out_ += ',';
        first_.back() = false;
    }
}

JsonWriter& JsonWriter::beginObject() {
    separate();
    out_ += '{';
    first_.push_back(true);
    return *this;
}

JsonWriter& JsonWriter::endObject() {
    out_ += '}';
    first_.pop_back();
    return *this;
}

JsonWriter& JsonWriter::beginArray() {
    separate();
    out_ += '[';
    first_.push_back(true);
    return *this;
}

JsonWriter& JsonWriter::endArray() {
    out_ += ']';
    first_.pop_back();
    return *this;
}

JsonWriter& JsonWriter::key(std::string_view name) {
    separate();
    AppendQuoted(out_, name);
    out_ += ':';
    afterKey_ = true;
    return *this;
}

JsonWriter& JsonWriter::string(std::string_view bytes) {
    separate();
    AppendQuoted(out_, bytes);
    return *this;
}

JsonWriter& JsonWriter::integer(int64_t value) {
    separate();
    out_ += std::to_string(value);
    return *this;
}

JsonWriter& JsonWriter::boolean(bool value) {
    separate();
    out_ += value ? "true" : "false";
    return *this;
}

JsonWriter& JsonWriter::null() {
    separate();
    out_ += "null";
    return *this;
}

JsonWriter& JsonWriter::value(const Variant& v) {
    switch (v.type()) {
        case VarType::Empty:
        case VarType::Null:
            return null();
        case VarType::Boolean:
            return boolean(v.boolean());
        case VarType::String:
            return string(v.string());
        case VarType::Integer:
        case VarType::Long:
        case VarType::Single:
        case VarType::Double:
            separate();
            out_ += Number(v);
            return *this;
        case VarType::Array:
            beginArray();
            for (const Variant& item : v.array()) value(item);
            return endArray();
        case VarType::Object:
            if (const auto& object = v.object()) return value(object->defaultValue());
            return null();
    }
    return null();
}

std::string JsonWriter::Quote(std::string_view bytes) {
    std::string out;
    out.reserve(bytes.size() + 2);
    AppendQuoted(out, bytes);
    return out;
}

void JsonWriter::AppendQuoted(std::string& out, std::string_view bytes) {
    static constexpr char hex[] = "0123456789abcdef";
    out += '"';
    for (const char c : bytes) {
        const auto b = static_cast<unsigned char>(c);
        switch (b) {
            case '"':
                out += "\\\"";
                continue;
            case '\\':
                out += "\\\\";
                continue;
            case '\n':
                out += "\\n";
                continue;
            case '\r':
                out += "\\r";
                continue;
            case '\t':
                out += "\\t";
                continue;
            case '\b':
                out += "\\b";
                continue;
            case '\f':
                out += "\\f";
                continue;
            default:
                break;
        }
        if (b < 0x20 || b >= 0x7F) {
            out += "\\u00";
            out += hex[b >> 4];
            out += hex[b & 0xF];
        } else {
            out += c;
        }
    }
    out += '"';
}

std::string JsonWriter::Number(const Variant& number) {
    if (!std::isfinite(CDbl(number))) return "null";
    std::string text = CStr(number);
    // JSON wants a digit before the point; CStr writes one, but a bare ".5" must never slip out.
    if (text.rfind(".", 0) == 0) text.insert(0, "0");
    if (text.rfind("-.", 0) == 0) text.insert(1, "0");
    return text;
}

JsonWriter& JsonWriter::raw(std::string_view json) {
    separate();
    out_ += json;
    return *this;
}

JsonWriter& JsonWriter::time(platform::DateTime t) {
    using namespace std::chrono;
    const auto day = floor<days>(t);
    const year_month_day ymd{day};
    const hh_mm_ss<milliseconds> clock{t - day};
    char text[64];
    std::snprintf(text, sizeof text, "%04d-%02u-%02uT%02ld:%02ld:%02ld.%03ld", int(ymd.year()),
                  unsigned(ymd.month()), unsigned(ymd.day()), long(clock.hours().count()),
                  long(clock.minutes().count()), long(clock.seconds().count()),
                  long(clock.subseconds().count()));
    return string(text);
}

}  // namespace maroset::gateway
