#include "platform/serial/SerialSettings.h"

#include <cctype>
#include <charconv>
#include <vector>

#include "lang/VbError.h"

namespace maroset::platform {

namespace {

[[noreturn]] void invalid() {
    throw VbError(err::InvalidPropertyValue);
}

std::vector<std::string_view> fields(std::string_view text) {
    std::vector<std::string_view> out;
    size_t start = 0;
    for (;;) {
        const size_t comma = text.find(',', start);
        std::string_view field = text.substr(start, comma - start);
        while (!field.empty() && field.front() == ' ') field.remove_prefix(1);
        while (!field.empty() && field.back() == ' ') field.remove_suffix(1);
        out.push_back(field);
        if (comma == std::string_view::npos) return out;
        start = comma + 1;
    }
}

int32_t number(std::string_view field) {
    int32_t value = 0;
    const auto [end, ec] = std::from_chars(field.data(), field.data() + field.size(), value);
    if (field.empty() || ec != std::errc() || end != field.data() + field.size()) invalid();
    return value;
}

}  // namespace

SerialSettings SerialSettings::Parse(std::string_view text) {
    const auto f = fields(text);
    if (f.size() != 4) invalid();
    SerialSettings s;
    s.baud = number(f[0]);
    if (s.baud <= 0) invalid();
    if (f[1].size() != 1) invalid();
    switch (std::tolower(static_cast<unsigned char>(f[1][0]))) {
        case 'n':
            s.parity = Parity::None;
            break;
        case 'e':
            s.parity = Parity::Even;
            break;
        case 'o':
            s.parity = Parity::Odd;
            break;
        case 'm':
            s.parity = Parity::Mark;
            break;
        case 's':
            s.parity = Parity::Space;
            break;
        default:
            invalid();
    }
    s.dataBits = number(f[2]);
    if (s.dataBits < 5 || s.dataBits > 8) invalid();
    if (f[3] == "1") {
        s.stopBits = StopBits::One;
    } else if (f[3] == "1.5") {
        s.stopBits = StopBits::OnePointFive;
    } else if (f[3] == "2") {
        s.stopBits = StopBits::Two;
    } else {
        invalid();
    }
    return s;
}

std::string SerialSettings::text() const {
    static constexpr char kParity[] = {'n', 'e', 'o', 'm', 's'};
    static constexpr const char* kStop[] = {"1", "1.5", "2"};
    return std::to_string(baud) + "," + kParity[static_cast<int>(parity)] + "," +
           std::to_string(dataBits) + "," + kStop[static_cast<int>(stopBits)];
}

}  // namespace maroset::platform
