#include "drivers/intech/IntechTagName.h"

#include "lang/Conversions.h"
#include "lang/Strings.h"

namespace maroset {

namespace {

bool within(double point, double low, double high) {
    return point >= low && point <= high;
}

std::string commandText(const std::string& kind, const std::string& point) {
    if (kind == "LAI") {
        const double p = CDbl(Variant(point));
        if (within(p, 1, 4)) return "EX E5 00:";
        if (within(p, 5, 8)) return "EX E5 01:";
        if (within(p, 9, 12)) return "EX E5 02:";
        if (within(p, 13, 16)) return "EX E5 03:";
        return {};
    }
    if (kind == "LDI" || kind == "LDO") return "EX DI:";
    if (kind == "EAI") {
        const double p = CDbl(Variant(point));
        if (within(p, 1, 16)) return "EX E1:";
        if (within(p, 17, 32)) return "EX E2:";
        if (within(p, 33, 48)) return "EX E3:";
        if (within(p, 49, 64)) return "EX E4:";
        return {};
    }
    return {};
}

}  // namespace

std::string IntechTagName::ReadCommand(std::string_view TagName) {
    const std::string address = Left(TagName, 2);
    const std::string kind = UCase(Mid(TagName, 3, 3));
    const std::string point = Mid(TagName, 6);
    const std::string text = commandText(kind, point);
    return text.empty() ? std::string() : "@" + address + text;
}

}  // namespace maroset
