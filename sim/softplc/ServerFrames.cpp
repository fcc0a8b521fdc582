#include "sim/softplc/ServerFrames.h"

#include <cstdio>

#include "core/Crc16Arc.h"

namespace maroset::sim {

namespace {

void threeDigits(std::string& out, unsigned value) {
    char buf[4];
    std::snprintf(buf, sizeof buf, "%03u", value % 1000);
    out += buf;
}

bool allDigits(std::string_view s) {
    for (const char c : s)
        if (c < '0' || c > '9') return false;
    return !s.empty();
}

}  // namespace

std::string ServerFrame::Check(std::string_view body) {
    uint16_t crc = crc16arc::Fold(body, 0);
    crc = crc16arc::Fold(static_cast<uint8_t>(3), crc);
    std::string out;
    threeDigits(out, crc >> 8);
    threeDigits(out, crc & 0xFF);
    return out;
}

std::string ServerFrame::Write(std::string_view type, int32_t number, std::string_view data) {
    std::string body = "<%";
    if (type.size() < 3) body.append(3 - type.size(), ' ');
    body += type;
    threeDigits(body, static_cast<unsigned>(number));
    body += ";~";
    body += data;
    body += ";~";
    return body + Check(body) + "%>";
}

std::optional<ServerFrame> ServerFrame::Read(std::string_view unit) {
    // "<%" + 3 + 3 + ";~" + ";~" + 6 at the least.
    if (unit.size() < 18 || unit.substr(0, 2) != "<%") return std::nullopt;
    const std::string_view body = unit.substr(0, unit.size() - 6);
    if (Check(body) != unit.substr(body.size())) return std::nullopt;
    const std::string_view digits = body.substr(5, 3);
    if (!allDigits(digits) || body.substr(8, 2) != ";~") return std::nullopt;
    if (body.size() < 12 || body.substr(body.size() - 2) != ";~") return std::nullopt;
    ServerFrame frame;
    frame.type = std::string(body.substr(2, 3));
    frame.number = std::stoi(std::string(digits));
    frame.data = std::string(body.substr(10, body.size() - 12));
    return frame;
}

void ServerFrameReader::feed(std::string_view bytes) {
    partial_.append(bytes);
    size_t start = 0;
    for (size_t at; (at = partial_.find("%>", start)) != std::string::npos; start = at + 2)
        units_.push_back(partial_.substr(start, at - start));
    partial_.erase(0, start);
    if (partial_.size() > MaxUnit) {
        // Keep a trailing '%': it may begin the delimiter of the next frame.
        const bool percent = partial_.back() == '%';
        units_.push_back(std::move(partial_));
        partial_ = percent ? "%" : "";
    }
}

bool ServerFrameReader::next(std::string& unit) {
    if (units_.empty()) return false;
    unit = std::move(units_.front());
    units_.pop_front();
    return true;
}

}  // namespace maroset::sim
