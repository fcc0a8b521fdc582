// Text from devices and hosts becomes numbers through the language's conversions.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <string>

#include "lang/Conversions.h"
#include "lang/Format.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const maroset::Variant text(std::string(reinterpret_cast<const char*>(data), size));
    for (auto convert : {+[](const maroset::Variant& v) { (void)maroset::CInt(v); },
                         +[](const maroset::Variant& v) { (void)maroset::CLng(v); },
                         +[](const maroset::Variant& v) { (void)maroset::CSng(v); },
                         +[](const maroset::Variant& v) { (void)maroset::CBool(v); },
                         +[](const maroset::Variant& v) { (void)maroset::Format(v, "###0.0"); },
                         +[](const maroset::Variant& v) { (void)maroset::Format(v, "000"); }}) {
        try {
            convert(text);
        } catch (const maroset::VbError&) {
        }
    }
    // Whatever reads as a number prints as text that reads back as the same number.
    const auto number = maroset::ParseNumber(text.string());
    if (number && std::isfinite(*number)) {
        try {
            const std::string printed = maroset::CStr(maroset::Variant(*number));
            const auto again = maroset::ParseNumber(printed);
            if (!again || maroset::CStr(maroset::Variant(*again)) != printed) __builtin_trap();
        } catch (const maroset::VbError&) {
        }
    }
    return 0;
}
