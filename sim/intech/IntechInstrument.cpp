#include "sim/intech/IntechInstrument.h"

#include <cmath>
#include <stdexcept>

namespace maroset::sim {

namespace {

size_t index(int point, int points, const char* kind) {
    if (point < 1 || point > points)
        throw std::out_of_range(std::string(kind) + " point " + std::to_string(point) +
                                " is not between 1 and " + std::to_string(points));
    return static_cast<size_t>(point - 1);
}

}  // namespace

IntechInstrument::IntechInstrument(std::string address) : address_(std::move(address)) {
    // Plausible starting values: every point different, so a host can tell them apart.
    for (int p = 1; p <= AnalogPoints; ++p) analog_[index(p, AnalogPoints, "LAI")] = 10.0f * p;
    for (int p = 1; p <= ExtendedPoints; ++p)
        extended_[index(p, ExtendedPoints, "EAI")] = static_cast<uint16_t>(p * 60);
    inputs_ = 0b0101;
}

float IntechInstrument::analog(int point) const {
    return analog_[index(point, AnalogPoints, "LAI")];
}

void IntechInstrument::setAnalog(int point, float value) {
    analog_[index(point, AnalogPoints, "LAI")] = value;
}

uint16_t IntechInstrument::extended(int point) const {
    return extended_[index(point, ExtendedPoints, "EAI")];
}

void IntechInstrument::setExtended(int point, uint32_t value) {
    extended_[index(point, ExtendedPoints, "EAI")] = static_cast<uint16_t>(value & 0x0FFF);
}

bool IntechInstrument::input(int point) const {
    return (inputs_ >> index(point, InputPoints, "LDI")) & 1;
}

void IntechInstrument::setInput(int point, bool on) {
    const int bit = 1 << index(point, InputPoints, "LDI");
    inputs_ = on ? (inputs_ | bit) : (inputs_ & ~bit);
}

bool IntechInstrument::output(int point) const {
    return (outputs_ >> index(point, OutputPoints, "LDO")) & 1;
}

void IntechInstrument::setOutput(int point, bool on) {
    const int bit = 1 << index(point, OutputPoints, "LDO");
    outputs_ = on ? (outputs_ | bit) : (outputs_ & ~bit);
}

void IntechInstrument::drift(int32_t step) {
    // Analog values swing around their own level; a quarter-unit resolution keeps the
    // one-decimal text of every step different.
    for (int p = 1; p <= AnalogPoints; ++p) {
        const double swing = 5.0 * std::sin(0.4 * step + p);
        analog_[static_cast<size_t>(p - 1)] =
            static_cast<float>(std::round((10.0 * p + swing) * 4.0) / 4.0);
    }
    for (int p = 1; p <= ExtendedPoints; ++p) {
        const uint16_t v = extended_[static_cast<size_t>(p - 1)];
        extended_[static_cast<size_t>(p - 1)] = static_cast<uint16_t>((v + 7 + p % 5) & 0x0FFF);
    }
    // Input 1 changes every other step, the others less often.
    constexpr int periods[InputPoints] = {2, 3, 5, 7};
    for (int i = 0; i < InputPoints; ++i)
        if (step % periods[i] == 0) inputs_ ^= 1 << i;
}

}  // namespace maroset::sim
