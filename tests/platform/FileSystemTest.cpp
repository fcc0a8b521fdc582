#include "platform/FileSystem.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <optional>
#include <sstream>
#include <string>

#include "core/VbError.h"
#include "support/ErrorOf.h"
#include "support/TempDir.h"

namespace maroset::platform {
namespace {

using test::errorOf;

namespace fs = std::filesystem;
using namespace std::string_literals;

std::string readAll(const fs::path& p) {
    std::ifstream in(p, std::ios::binary);
    std::ostringstream out;
    out << in.rdbuf();
    return out.str();
}

// Drive C: mapped to a fresh temporary directory.
class DriveC : public ::testing::Test {
  protected:
    test::TempDir tmp;
    fs::path root = tmp.path() / "drive_c";
    FileSystem files{root};
};

TEST_F(DriveC, SystemPathsMapUnderTheRoot) {
    EXPECT_EQ(files.resolve("C:\\NUVDiskIO\\Line1.mdb"), root / "NUVDiskIO" / "Line1.mdb");
    EXPECT_EQ(files.resolve("c:\\NUVDiskIO\\Line1.mdb"), root / "NUVDiskIO" / "Line1.mdb");
    EXPECT_EQ(files.resolve("C:\\MarosetErrors.txt"), root / "MarosetErrors.txt");
    EXPECT_EQ(files.resolve("\\MarosetErrors.txt"), root / "MarosetErrors.txt");
    EXPECT_EQ(files.resolve("NUVDiskIO\\a.mdb"), root / "NUVDiskIO" / "a.mdb");
    EXPECT_EQ(files.resolve("C:/a/./b/../c"), root / "a" / "c");
    EXPECT_EQ(files.resolve("C:\\NUVDiskIO\\"), root / "NUVDiskIO");
    EXPECT_EQ(files.resolve("C:"), root);
    EXPECT_EQ(files.resolve("C:\\\\a\\\\b"), root / "a" / "b");  // doubled separators
}

TEST_F(DriveC, ResolveCreatesAMissingRoot) {
    ASSERT_FALSE(fs::exists(root));
    files.resolve("C:\\x");
    EXPECT_TRUE(fs::is_directory(root));
}

TEST_F(DriveC, PathsLeavingTheDriveAreRefused) {
    for (const std::string path :
         {"C:\\..\\x"s, "C:\\a\\..\\..\\x"s, "..\\x"s, "C:\\a\\b\\..\\..\\.."s, "D:\\x"s, "d:x"s,
          "\\\\server\\share\\x"s, "C:\\a\0b"s}) {
        SCOPED_TRACE(path);
        EXPECT_EQ(errorOf([&] { files.resolve(path); }), err::PathFileAccess);
        EXPECT_EQ(errorOf([&] { files.AppendText(path, "x"); }), err::PathFileAccess);
        EXPECT_FALSE(files.FileExists(path));
        EXPECT_FALSE(files.FolderExists(path));
    }
    EXPECT_FALSE(fs::exists(tmp.path() / "x"));
}

TEST_F(DriveC, CreateFolderMakesExactlyOneLevel) {
    EXPECT_FALSE(files.FolderExists("C:\\NUVDiskIO"));
    files.CreateFolder("C:\\NUVDiskIO");
    EXPECT_TRUE(fs::is_directory(root / "NUVDiskIO"));
    EXPECT_TRUE(files.FolderExists("C:\\NUVDiskIO"));
    EXPECT_FALSE(files.FileExists("C:\\NUVDiskIO"));
    EXPECT_EQ(errorOf([&] { files.CreateFolder("C:\\NUVDiskIO"); }), err::PathFileAccess);
    EXPECT_EQ(errorOf([&] { files.CreateFolder("C:\\a\\b"); }), err::PathNotFound);
    EXPECT_FALSE(fs::exists(root / "a"));
    EXPECT_EQ(errorOf([&] { files.CreateFolder("E:\\a"); }), err::PathFileAccess);
}

TEST_F(DriveC, AppendTextWritesExactBytes) {
    const std::string first = "3/7/2026 9:00:00 AM\r\n";
    const std::string second = "bin\0\xff\xe9"s;
    files.AppendText("C:\\MarosetErrors.txt", first);
    files.AppendText("c:\\MarosetErrors.txt", second);
    EXPECT_EQ(readAll(root / "MarosetErrors.txt"), first + second);
    EXPECT_TRUE(files.FileExists("C:\\MarosetErrors.txt"));
    EXPECT_FALSE(files.FolderExists("C:\\MarosetErrors.txt"));
}

TEST_F(DriveC, AppendTextFailuresAreFileErrors) {
    EXPECT_EQ(errorOf([&] { files.AppendText("C:\\NoSuchFolder\\log.txt", "x"); }),
              err::PathNotFound);
    files.CreateFolder("C:\\Dir");
    EXPECT_EQ(errorOf([&] { files.AppendText("C:\\Dir", "x"); }), err::PathFileAccess);
}

TEST_F(DriveC, DriveRootCanBeMovedByTheHost) {
    const fs::path other = tmp.path() / "other";
    files.setDriveRoot(other);
    EXPECT_EQ(files.driveRoot(), other);
    files.AppendText("C:\\f.txt", "x");
    EXPECT_EQ(readAll(other / "f.txt"), "x");
}

// DefaultDriveRoot reads the environment; each case puts it back.
class DefaultDriveRoot : public ::testing::Test {
  protected:
    void SetUp() override {
        save("XDG_DATA_HOME", xdg_);
        save("HOME", home_);
    }
    void TearDown() override {
        restore("XDG_DATA_HOME", xdg_);
        restore("HOME", home_);
    }

  private:
    static void save(const char* name, std::optional<std::string>& slot) {
        if (const char* v = std::getenv(name)) slot = v;
    }
    static void restore(const char* name, const std::optional<std::string>& slot) {
        if (slot)
            setenv(name, slot->c_str(), 1);
        else
            unsetenv(name);
    }
    std::optional<std::string> xdg_, home_;
};

TEST_F(DefaultDriveRoot, PrefersXdgDataHome) {
    setenv("XDG_DATA_HOME", "/data/u", 1);
    setenv("HOME", "/home/u", 1);
    EXPECT_EQ(FileSystem::DefaultDriveRoot(), fs::path("/data/u/maroset/drive_c"));
}

TEST_F(DefaultDriveRoot, FallsBackToHomeWhenXdgIsUnsetOrRelative) {
    setenv("HOME", "/home/u", 1);
    unsetenv("XDG_DATA_HOME");
    EXPECT_EQ(FileSystem::DefaultDriveRoot(), fs::path("/home/u/.local/share/maroset/drive_c"));
    setenv("XDG_DATA_HOME", "", 1);
    EXPECT_EQ(FileSystem::DefaultDriveRoot(), fs::path("/home/u/.local/share/maroset/drive_c"));
    setenv("XDG_DATA_HOME", "relative/dir", 1);
    EXPECT_EQ(FileSystem::DefaultDriveRoot(), fs::path("/home/u/.local/share/maroset/drive_c"));
}

}  // namespace
}  // namespace maroset::platform
