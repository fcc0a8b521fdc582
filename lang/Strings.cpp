#include "lang/Strings.h"

#include <algorithm>
#include <vector>

#include "lang/VbError.h"

namespace maroset {

namespace {

void requireStart(int32_t start) {
    if (start < 1) throw VbError(err::InvalidProcedureCall);
}

void requireLength(int32_t length) {
    if (length < 0) throw VbError(err::InvalidProcedureCall);
}

}  // namespace

std::string UCase(std::string_view s) {
    std::string out(s);
    for (char& c : out) {
        if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 'a' + 'A');
    }
    return out;
}

std::string LCase(std::string_view s) {
    std::string out(s);
    for (char& c : out) {
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    }
    return out;
}

std::string Left(std::string_view s, int32_t length) {
    requireLength(length);
    return std::string(s.substr(0, static_cast<size_t>(length)));
}

std::string Right(std::string_view s, int32_t length) {
    requireLength(length);
    const size_t n = std::min(s.size(), static_cast<size_t>(length));
    return std::string(s.substr(s.size() - n));
}

std::string Mid(std::string_view s, int32_t start) {
    requireStart(start);
    if (static_cast<size_t>(start) > s.size()) return {};
    return std::string(s.substr(static_cast<size_t>(start) - 1));
}

std::string Mid(std::string_view s, int32_t start, int32_t length) {
    requireStart(start);
    requireLength(length);
    if (static_cast<size_t>(start) > s.size()) return {};
    return std::string(s.substr(static_cast<size_t>(start) - 1, static_cast<size_t>(length)));
}

int32_t InStr(int32_t start, std::string_view s, std::string_view find) {
    requireStart(start);
    if (s.empty()) return 0;
    if (find.empty()) return start;
    if (static_cast<size_t>(start) > s.size()) return 0;
    const size_t at = s.find(find, static_cast<size_t>(start) - 1);
    return at == std::string_view::npos ? 0 : static_cast<int32_t>(at) + 1;
}

int32_t InStr(std::string_view s, std::string_view find) {
    return InStr(1, s, find);
}

std::string Trim(std::string_view s) {
    const size_t first = s.find_first_not_of(' ');
    if (first == std::string_view::npos) return {};
    const size_t last = s.find_last_not_of(' ');
    return std::string(s.substr(first, last - first + 1));
}

VbArray<std::string> Split(std::string_view s, std::string_view delimiter) {
    std::vector<std::string> pieces;
    if (!s.empty()) {
        if (delimiter.empty()) {
            pieces.emplace_back(s);
        } else {
            size_t start = 0;
            for (size_t at; (at = s.find(delimiter, start)) != std::string_view::npos;
                 start = at + delimiter.size())
                pieces.emplace_back(s.substr(start, at - start));
            pieces.emplace_back(s.substr(start));
        }
    }
    return VbArray<std::string>(0, std::move(pieces));
}

}  // namespace maroset
