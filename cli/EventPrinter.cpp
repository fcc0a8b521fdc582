#include "cli/EventPrinter.h"

#include <algorithm>

#include "gateway/JsonWriter.h"
#include "gateway/LinkStatusJson.h"
#include "lang/Conversions.h"
#include "lang/Object.h"

namespace maroset::cli {

using gateway::JsonWriter;

namespace {

// Control bytes as \xNN, so a value or message never breaks its line.
std::string printable(std::string_view bytes, bool escapeQuotes = false) {
    static constexpr char hex[] = "0123456789ABCDEF";
    std::string text;
    for (const char c : bytes) {
        const auto b = static_cast<unsigned char>(c);
        if (b < 0x20 || b == 0x7F) {
            text += "\\x";
            text += hex[b >> 4];
            text += hex[b & 0xF];
            continue;
        }
        if (escapeQuotes && (c == '"' || c == '\\')) text += '\\';
        text += c;
    }
    return text;
}

}  // namespace

EventPrinter::EventPrinter(std::ostream& out, bool json) : out_(out), json_(json) {}

void EventPrinter::line(std::string_view text) {
    out_ << text << '\n';
    out_.flush();
}

void EventPrinter::valueChange(const VbArray<int32_t>& handles, int16_t count,
                               const VbArray<Variant>& values) {
    ++valueChanges_;
    if (json_) {
        JsonWriter j;
        j.beginObject().key("event").string("ValueChange").key("count").integer(count);
        j.key("handles").beginArray();
        for (const int32_t h : handles) j.integer(h);
        j.endArray().key("values").beginArray();
        for (const Variant& v : values) j.value(v);
        j.endArray().endObject();
        line(j.str());
        return;
    }
    // Handles and values pair up by position; a report whose arrays differ in length shows
    // what it has on either side.
    std::string text = "ValueChange ";
    const int32_t n = std::max(handles.size(), values.size());
    for (int32_t i = 0; i < n; ++i) {
        text += i == 0 ? " " : ", ";
        if (i < handles.size()) {
            const int32_t h = handles(handles.LBound() + i);
            text += std::to_string(h);
            if (auto it = labels_.find(h); it != labels_.end()) text += " " + it->second;
        } else {
            text += "?";
        }
        text += " = ";
        text += i < values.size() ? Readable(values(values.LBound() + i)) : "?";
    }
    if (n == 0) text += " (no values)";
    line(text);
}

void EventPrinter::driverError(const std::string& driver, const std::string& from,
                               const std::string& message) {
    ++driverErrors_;
    if (json_) {
        JsonWriter j;
        j.beginObject().key("event").string("DriverError");
        j.key("driver").string(driver).key("from").string(from).key("message").string(message);
        line(j.endObject().str());
        return;
    }
    line("DriverError  " + printable(driver) + "  " + printable(from) + ": " + printable(message));
}

void EventPrinter::reply(const Reply& r) {
    if (json_) {
        JsonWriter j;
        j.beginObject().key("reply").string(r.command).key("ok").boolean(r.ok);
        if (!r.ok) {
            j.key("error").beginObject().key("number").integer(r.number);
            j.key("description").string(r.description).endObject();
            if (!r.node.empty()) j.key("node").string(r.node);
        }
        if (r.ok && r.nodes) {
            j.key("nodes").beginArray();
            for (const auto& n : *r.nodes) {
                j.beginObject().key("name").string(n.name).key("driver").value(n.driver);
                j.endObject();
            }
            j.endArray();
        }
        if (r.ok && r.status) {
            j.key("nodes").beginArray();
            for (const auto& s : *r.status) gateway::LinkStatusJson::Write(j, s);
            j.endArray();
        }
        line(j.endObject().str());
        return;
    }
    std::string text = printable(r.command) + ": ";
    if (!r.ok) {
        text += "error " + std::to_string(r.number) + ": " + r.description;
        if (!r.detail.empty()) text += " (" + printable(r.detail) + ")";
    } else {
        text += "ok";
        if (r.nodes) {
            text += ": ";
            if (r.nodes->empty()) text += "no nodes";
            for (size_t i = 0; i < r.nodes->size(); ++i) {
                const auto& n = (*r.nodes)[i];
                if (i) text += ", ";
                const std::string driver =
                    n.driver.isString() ? n.driver.string() : Readable(n.driver);
                text += printable(n.name) + " (" + printable(driver) + ")";
            }
        }
        if (r.status) {
            text += ": ";
            if (r.status->empty()) text += "no nodes";
            for (size_t i = 0; i < r.status->size(); ++i)
                text += (i ? "; " : "") + ReadableStatus((*r.status)[i]);
        }
    }
    line(text);
}

std::string EventPrinter::ReadableStatus(const LinkStatus& s) {
    const LinkCounters& c = s.counters;
    auto at = [](platform::DateTime t) {
        return platform::FormatShortDate(t) + " " + platform::FormatLongTime(t);
    };
    std::string text = printable(s.node) + " (" + printable(s.driver) + ") " +
                       std::string(LinkStateName(s.state)) + " since " + at(s.since);
    text += ", " + std::to_string(c.requests) + " requests, " + std::to_string(c.replies) +
            " replies, " + std::to_string(c.timeouts) + " time-outs, " + std::to_string(c.retries) +
            " retries, " + std::to_string(c.badChecks) + " bad checks, " +
            std::to_string(c.reconnects) + " reconnects, " + std::to_string(c.values) +
            " values, " + std::to_string(c.driverErrors) + " driver errors";
    if (s.last) text += ", last: " + printable(s.last->text) + " at " + at(s.last->time);
    return text;
}

std::string EventPrinter::Readable(const Variant& v) {
    switch (v.type()) {
        case VarType::Empty:
            return "Empty";
        case VarType::Null:
            return "Null";
        case VarType::String:
            return "\"" + printable(v.string(), true) + "\"";
        case VarType::Array: {
            std::string text = "(";
            bool first = true;
            for (const Variant& item : v.array()) {
                if (!first) text += ", ";
                first = false;
                text += Readable(item);
            }
            return text + ")";
        }
        case VarType::Object:
            if (const auto& object = v.object()) return Readable(object->defaultValue());
            return "Nothing";
        default:
            return CStr(v);
    }
}

}  // namespace maroset::cli
