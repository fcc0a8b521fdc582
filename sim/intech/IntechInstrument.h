#pragma once

#include <array>
#include <cstdint>
#include <string>

namespace maroset::sim {

// The data of one simulated Intech instrument at one station address: sixteen analog inputs
// (IEEE single values, four per group), sixty-four extended analog inputs (12-bit values,
// sixteen per block), four digital inputs and two digital outputs. Points count from 1, as the
// instrument's tag names do; a point outside the range fails with std::out_of_range.
class IntechInstrument {
  public:
    static constexpr int AnalogPoints = 16;
    static constexpr int ExtendedPoints = 64;
    static constexpr int InputPoints = 4;
    static constexpr int OutputPoints = 2;

    explicit IntechInstrument(std::string address);

    const std::string& address() const { return address_; }

    float analog(int point) const;
    void setAnalog(int point, float value);
    // 0 to 4095; larger values keep their low twelve bits, as the converter's range does.
    uint16_t extended(int point) const;
    void setExtended(int point, uint32_t value);
    bool input(int point) const;
    void setInput(int point, bool on);
    bool output(int point) const;
    void setOutput(int point, bool on);

    // The digital words of the status reply: bit 0 is point 1.
    int inputsWord() const { return inputs_; }
    int outputsWord() const { return outputs_; }

    // Moves every value a little (step counts the calls), so a host sees changes.
    void drift(int32_t step);

  private:
    std::string address_;
    std::array<float, AnalogPoints> analog_{};
    std::array<uint16_t, ExtendedPoints> extended_{};
    int inputs_ = 0;
    int outputs_ = 0;
};

}  // namespace maroset::sim
