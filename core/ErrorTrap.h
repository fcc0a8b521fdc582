#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "lang/VbError.h"
#include "platform/Clock.h"
#include "platform/FileSystem.h"

namespace maroset {

// The shared error handler of every procedure, with its process-wide state: the trap switch,
// the time of the last error and the burst counters.
//
// HandleError logs the error to "C:\MarosetErrors.txt" and answers 0 (retry the failing
// statement) while the current burst has at most 5 errors, 1 (go on with the next statement)
// after that. Errors more than 10 s apart start a new burst; from the 21st error of a burst
// on, every error also shows "Errorcount Exceeded Please call tech support" in a modal
// message box.
class ErrorTrap {
  public:
    using MessageBox = std::function<void(const std::string& text)>;

    ErrorTrap(const platform::Clock& clock, const platform::FileSystem& files,
              MessageBox messageBox);

    // The trap switch: off unless a host turns it on.
    bool enabled() const { return enabled_; }
    void setEnabled(bool on) { enabled_ = on; }

    int16_t HandleError(const std::string& ModuleName, const std::string& ProcName,
                        const VbError& pending);
    // Appends one record to the log; a failure to write is ignored.
    void WriteErrorLog(const std::string& Message, const std::string& Description,
                       const std::string& Heading, const std::string& Location, int32_t LineNumber);

    int32_t burstCount() const { return burst_; }
    int32_t longBurstCount() const { return longBurst_; }

    static constexpr const char* LogPath = "C:\\MarosetErrors.txt";

  private:
    const platform::Clock& clock_;
    const platform::FileSystem& files_;
    MessageBox messageBox_;
    bool enabled_ = false;
    platform::DateTime lastError_ = platform::ZeroDate;
    int32_t burst_ = 0;
    int32_t longBurst_ = 0;
};

}  // namespace maroset
