#include "platform/FileSystem.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>

#include "lang/VbError.h"
#include "support/ErrorOf.h"
#include "support/TempDir.h"

namespace maroset::platform {
namespace {

using test::errorOf;
namespace fs = std::filesystem;
using namespace std::string_literals;

// Drive C: mapped to a fresh temporary directory.
class DriveC : public ::testing::Test {
  protected:
    test::TempDir tmp;
    fs::path root = tmp.path() / "drive_c";
    FileSystem files{root};
};

TEST_F(DriveC, SystemPathsMapUnderTheRootWhichIsCreatedOnDemand) {
    ASSERT_FALSE(fs::exists(root));
    for (const auto& [path, native] : {std::pair{"C:\\NUVDiskIO\\Line1.mdb", "NUVDiskIO/Line1.mdb"},
                                       {"\\MarosetErrors.txt", "MarosetErrors.txt"},
                                       {"NUVDiskIO\\a.mdb", "NUVDiskIO/a.mdb"},
                                       {"c:/a/./b/..\\\\c\\", "a/c"}})
        EXPECT_EQ(files.resolve(path), root / native) << path;
    EXPECT_EQ(files.resolve("C:"), root);
    EXPECT_TRUE(fs::is_directory(root));
}

TEST_F(DriveC, PathsLeavingTheDriveAreRefused) {
    for (const std::string path :
         {"C:\\..\\x"s, "C:\\a\\..\\..\\x"s, "..\\x"s, "C:\\a\\b\\..\\..\\.."s, "D:\\x"s, "d:x"s,
          "\\\\server\\share\\x"s, "C:\\a\0b"s}) {
        EXPECT_EQ(errorOf([&] { files.AppendText(path, "x"); }), err::PathFileAccess) << path;
        EXPECT_FALSE(files.FileExists(path) || files.FolderExists(path)) << path;
    }
    EXPECT_FALSE(fs::exists(tmp.path() / "x"));
}

TEST_F(DriveC, CreateFolderMakesExactlyOneLevel) {
    files.CreateFolder("c:\\NUVDiskIO");
    EXPECT_TRUE(fs::is_directory(root / "NUVDiskIO"));
    EXPECT_TRUE(files.FolderExists("C:\\NUVDiskIO") && !files.FileExists("C:\\NUVDiskIO"));
    EXPECT_EQ(errorOf([&] { files.CreateFolder("C:\\NUVDiskIO"); }), err::PathFileAccess);
    EXPECT_EQ(errorOf([&] { files.CreateFolder("C:\\a\\b"); }), err::PathNotFound);
    EXPECT_FALSE(fs::exists(root / "a"));
}

TEST_F(DriveC, AppendTextWritesExactBytes) {
    files.AppendText("C:\\MarosetErrors.txt", "3/7/2026 9:00:00 AM\r\n");
    files.AppendText("c:\\MarosetErrors.txt", "bin\0\xff\xe9"s);
    std::ifstream in(root / "MarosetErrors.txt", std::ios::binary);
    EXPECT_EQ(std::string(std::istreambuf_iterator<char>(in), {}),
              "3/7/2026 9:00:00 AM\r\nbin\0\xff\xe9"s);
    EXPECT_TRUE(files.FileExists("C:\\MarosetErrors.txt") &&
                !files.FolderExists("C:\\MarosetErrors.txt"));
    EXPECT_EQ(errorOf([&] { files.AppendText("C:\\NoSuchFolder\\log.txt", "x"); }),
              err::PathNotFound);
    EXPECT_EQ(errorOf([&] { files.AppendText("C:\\", "x"); }), err::PathFileAccess);
}

TEST(DefaultDriveRoot, AbsoluteXdgDataHomeElseHome) {
    const char* had = std::getenv("XDG_DATA_HOME");
    const std::string old = had ? had : "";
    ASSERT_NE(std::getenv("HOME"), nullptr);
    const fs::path home = fs::path(std::getenv("HOME")) / ".local/share/maroset/drive_c";
    for (const auto& [xdg, expected] :
         {std::pair<const char*, fs::path>{"/d", "/d/maroset/drive_c"},
          {"", home},
          {"rel", home}}) {
        setenv("XDG_DATA_HOME", xdg, 1);
        EXPECT_EQ(FileSystem::DefaultDriveRoot(), expected) << xdg;
    }
    unsetenv("XDG_DATA_HOME");
    EXPECT_EQ(FileSystem::DefaultDriveRoot(), home);
    if (had) setenv("XDG_DATA_HOME", old.c_str(), 1);  // as the environment was
}

}  // namespace
}  // namespace maroset::platform
