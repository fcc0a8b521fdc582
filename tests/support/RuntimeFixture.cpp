#include "support/RuntimeFixture.h"

#include <fstream>
#include <iterator>
#include <memory>

#include "platform/VirtualClock.h"

namespace maroset::test {

namespace {

std::unique_ptr<Runtime> makeRuntime(const std::filesystem::path& root,
                                     platform::VirtualEventLoop*& loopOut) {
    using namespace std::chrono;
    auto loop = std::make_unique<platform::VirtualEventLoop>();
    loopOut = loop.get();
    const platform::DateTime start{local_days{year{2026} / 3 / 7}.time_since_epoch() + 9h};
    auto clock = std::make_unique<platform::VirtualClock>(*loop, start);
    return std::make_unique<Runtime>(std::move(loop), std::move(clock), root);
}

}  // namespace

RuntimeFixture::RuntimeFixture() : scope_(makeRuntime(drive_.path(), loop_)) {
    scope_->setMessageBox([this](const std::string& text) { messageBoxes.push_back(text); });
}

RuntimeFixture::~RuntimeFixture() = default;

std::string RuntimeFixture::readDriveFile(const std::string& relative) const {
    std::ifstream in(drive_.path() / relative, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

size_t RuntimeFixture::errorLogRecords() const {
    const std::string log = readDriveFile("MarosetErrors.txt");
    size_t n = 0;
    for (size_t at = log.find("Date: "); at != std::string::npos; at = log.find("Date: ", at + 1))
        ++n;
    return n;
}

}  // namespace maroset::test
