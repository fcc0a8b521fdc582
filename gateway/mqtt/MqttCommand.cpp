#include "gateway/mqtt/MqttCommand.h"

#include <charconv>
#include <cmath>
#include <limits>

#include "gateway/mqtt/SparkplugMetric.h"
#include "sparkplug_b.pb.h"

namespace maroset::gateway {

namespace {

// A cursor over a JSON text that reads one scalar, or an object of scalars, and nothing more.
class JsonScalarReader {
  public:
    explicit JsonScalarReader(std::string_view text) : s_(text) {}

    std::optional<Variant> payload(std::string& error) {
        skipBlanks();
        std::optional<Variant> result;
        if (peek() == '{') {
            result = object(error);
        } else {
            result = scalar(error);
        }
        skipBlanks();
        if (result && pos_ != s_.size()) {
            error = "unexpected text after the value";
            return std::nullopt;
        }
        return result;
    }

  private:
    char peek() const { return pos_ < s_.size() ? s_[pos_] : '\0'; }
    void skipBlanks() {
        while (pos_ < s_.size() && (s_[pos_] == ' ' || s_[pos_] == '\t' || s_[pos_] == '\n' ||
                                    s_[pos_] == '\r'))
            ++pos_;
    }
    bool literal(std::string_view word) {
        if (s_.substr(pos_, word.size()) != word) return false;
        pos_ += word.size();
        return true;
    }

    std::optional<Variant> object(std::string& error) {
        ++pos_;  // '{'
        std::optional<Variant> value;
        skipBlanks();
        if (peek() == '}') {
            error = "no \"value\" in the object";
            return std::nullopt;
        }
        for (;;) {
            skipBlanks();
            std::optional<std::string> key = string(error);
            if (!key) return std::nullopt;
            skipBlanks();
            if (peek() != ':') {
                error = "':' expected after a key";
                return std::nullopt;
            }
            ++pos_;
            skipBlanks();
            std::optional<Variant> v = scalar(error);
            if (!v) return std::nullopt;
            if (*key == "value") value = std::move(v);
            skipBlanks();
            if (peek() == ',') {
                ++pos_;
                continue;
            }
            if (peek() == '}') {
                ++pos_;
                break;
            }
            error = "',' or '}' expected";
            return std::nullopt;
        }
        if (!value) error = "no \"value\" in the object";
        return value;
    }

    std::optional<Variant> scalar(std::string& error) {
        const char c = peek();
        if (c == '"') {
            std::optional<std::string> text = string(error);
            if (!text) return std::nullopt;
            return Variant(std::move(*text));
        }
        if (literal("true")) return Variant(true);
        if (literal("false")) return Variant(false);
        if (literal("null")) return Variant::Null();
        if (c == '-' || (c >= '0' && c <= '9')) return number(error);
        error = "a value must be a number, a string, true, false or null";
        return std::nullopt;
    }

    std::optional<Variant> number(std::string& error) {
        const size_t start = pos_;
        while (pos_ < s_.size() && std::string_view("+-0123456789.eE").find(s_[pos_]) !=
                                        std::string_view::npos)
            ++pos_;
        double d = 0;
        const char* first = s_.data() + start;
        const char* last = s_.data() + pos_;
        const auto [end, ec] = std::from_chars(first, last, d);
        if (ec != std::errc() || end != last || !std::isfinite(d)) {
            error = "bad number";
            return std::nullopt;
        }
        if (d == std::trunc(d) && d >= std::numeric_limits<int32_t>::min() &&
            d <= std::numeric_limits<int32_t>::max())
            return Variant(static_cast<int32_t>(d));
        return Variant(d);
    }

    std::optional<std::string> string(std::string& error) {
        if (peek() != '"') {
            error = "a string was expected";
            return std::nullopt;
        }
        ++pos_;
        std::string out;
        while (pos_ < s_.size()) {
            const char c = s_[pos_++];
            if (c == '"') return out;
            if (static_cast<unsigned char>(c) < 0x20) break;
            if (c != '\\') {
                out.push_back(c);
                continue;
            }
            if (pos_ >= s_.size()) break;
            const char e = s_[pos_++];
            switch (e) {
                case '"': case '\\': case '/': out.push_back(e); break;
                case 'b': out.push_back('\b'); break;
                case 'f': out.push_back('\f'); break;
                case 'n': out.push_back('\n'); break;
                case 'r': out.push_back('\r'); break;
                case 't': out.push_back('\t'); break;
                case 'u': {
                    unsigned code = 0;
                    const char* first = s_.data() + pos_;
                    if (s_.size() - pos_ < 4 ||
                        std::from_chars(first, first + 4, code, 16).ptr != first + 4) {
                        error = "bad \\u escape";
                        return std::nullopt;
                    }
                    pos_ += 4;
                    if (code > 0xFF) {
                        error = "text beyond Latin-1";
                        return std::nullopt;
                    }
                    out.push_back(static_cast<char>(code));
                    break;
                }
                default: error = "bad escape"; return std::nullopt;
            }
        }
        error = "unterminated string";
        return std::nullopt;
    }

    std::string_view s_;
    size_t pos_ = 0;
};

}  // namespace

std::optional<Variant> MqttCommand::ParseSet(std::string_view payload, std::string& error) {
    if (payload.size() > kMaxSetPayload) {
        error = "payload larger than " + std::to_string(kMaxSetPayload) + " bytes";
        return std::nullopt;
    }
    return JsonScalarReader(payload).payload(error);
}

std::optional<std::vector<MetricWrite>> MqttCommand::ParseSparkplug(std::string_view payload,
                                                                     std::string& error) {
    if (payload.size() > kMaxSparkplugPayload) {
        error = "payload larger than " + std::to_string(kMaxSparkplugPayload) + " bytes";
        return std::nullopt;
    }
    sparkplug::Payload message;
    if (!message.ParseFromArray(payload.data(), static_cast<int>(payload.size()))) {
        error = "not a Sparkplug B payload";
        return std::nullopt;
    }
    if (static_cast<size_t>(message.metrics_size()) > kMaxMetrics) {
        error = "more than " + std::to_string(kMaxMetrics) + " metrics";
        return std::nullopt;
    }
    std::vector<MetricWrite> writes;
    writes.reserve(static_cast<size_t>(message.metrics_size()));
    for (const auto& metric : message.metrics()) {
        if (!metric.has_name() && !metric.has_alias()) {
            error = "a metric without a name or an alias";
            return std::nullopt;
        }
        MetricWrite& w = writes.emplace_back();
        w.name = metric.name();
        if (metric.has_alias()) w.alias = metric.alias();
        w.value = SparkplugMetric::ValueOf(metric);
    }
    return writes;
}

}  // namespace maroset::gateway
