#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "platform/VirtualEventLoop.h"
#include "support/TempDir.h"

namespace maroset::test {

// A fresh runtime for each test: a virtual loop whose clock starts at 3/7/2026 9:00:00 AM,
// a temporary drive root, and message boxes recorded instead of shown.
class RuntimeFixture : public ::testing::Test {
  protected:
    RuntimeFixture();
    ~RuntimeFixture() override;

    Runtime& runtime() { return *scope_; }
    platform::VirtualEventLoop& loop() { return *loop_; }
    const std::filesystem::path& driveRoot() const { return drive_.path(); }
    void advance(std::chrono::milliseconds d) { loop_->advance(d); }
    // Reads a file under the drive root ("" when it does not exist).
    std::string readDriveFile(const std::string& relative) const;
    // Number of records in the error log, C:\MarosetErrors.txt.
    size_t errorLogRecords() const;

    std::vector<std::string> messageBoxes;

  private:
    TempDir drive_;
    platform::VirtualEventLoop* loop_;
    ScopedRuntime scope_;
};

}  // namespace maroset::test
