// Tag names come from hosts and project files. Whatever they hold, AddItem stores the tag or
// fails with a clear run-time error, and the poll list holds each command at most once.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include "core/ScopedRuntime.h"
#include "drivers/intech/ClsDriverIntech.h"
#include "drivers/intech/FrmNUVIntech.h"
#include "drivers/intech/IntechTagName.h"
#include "lang/VbError.h"
#include "platform/SystemClock.h"
#include "platform/VirtualEventLoop.h"

namespace {

// A point that is not a number is a type mismatch; one too large for a number ("1D400"), an
// overflow.
bool expected(const maroset::VbError& e) {
    return e.number() == maroset::err::TypeMismatch || e.number() == maroset::err::Overflow;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    using namespace maroset;
    static ScopedRuntime scope(std::make_unique<Runtime>(
        std::make_unique<platform::VirtualEventLoop>(), std::make_unique<platform::SystemClock>(),
        std::filesystem::temp_directory_path()));

    auto driver = std::make_shared<ClsDriverIntech>();
    driver->startup(" ", "Meter");
    std::string_view input(reinterpret_cast<const char*>(data), size);
    int16_t handle = 0;
    std::set<std::string> commands;
    while (!input.empty() && handle < 200) {
        const size_t nl = input.find('\n');
        const std::string tag(input.substr(0, nl));
        input = nl == std::string_view::npos ? std::string_view() : input.substr(nl + 1);
        try {
            const std::string command = IntechTagName::ReadCommand(tag);
            if (!command.empty() && (command[0] != '@' || command.back() != ':')) std::abort();
            commands.insert(command);
        } catch (const VbError& e) {
            if (!expected(e)) std::abort();
        }
        try {
            driver->AddItem(tag, ++handle);
        } catch (const VbError& e) {
            if (!expected(e)) std::abort();
        }
    }
    // Each distinct command once, in the order first seen, plus at most one empty entry.
    FrmNUVIntech& owner = *driver->NUVIntech();
    std::set<std::string> listed;
    for (int32_t i = 0; i <= owner.PollCommandUBound(); ++i) {
        const std::string c = owner.PollCommand(i);
        if (!c.empty() && (!listed.insert(c).second || !commands.count(c))) std::abort();
    }
    if (driver->TagNames().UBound() != driver->TagCount() + 1) std::abort();
    driver->shutdown();
    return 0;
}
