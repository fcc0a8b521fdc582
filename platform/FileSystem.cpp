#include "platform/FileSystem.h"

#include <fcntl.h>
#include <pwd.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <system_error>
#include <vector>

#include "lang/VbError.h"

namespace maroset::platform {

namespace fs = std::filesystem;

namespace {

[[noreturn]] void fail(int32_t number) {
    throw VbError(number);
}

// The path below the drive root, as components, or a refusal (75) when the text names another
// drive or climbs above the root. Checked on the text alone: the drive root is ours, and a
// link inside it that points elsewhere is the owner's choice.
std::vector<std::string> splitDrivePath(std::string_view path) {
    if (path.find('\0') != std::string_view::npos) fail(err::PathFileAccess);
    auto isSep = [](char c) { return c == '\\' || c == '/'; };
    std::string_view rest = path;
    if (rest.size() >= 2 && rest[1] == ':') {
        if (rest[0] != 'C' && rest[0] != 'c') fail(err::PathFileAccess);
        rest.remove_prefix(2);
    } else if (rest.size() >= 2 && isSep(rest[0]) && isSep(rest[1])) {
        fail(err::PathFileAccess);  // "\\server\share": another machine, not drive C:
    }

    std::vector<std::string> parts;
    size_t i = 0;
    while (i <= rest.size()) {
        size_t j = i;
        while (j < rest.size() && !isSep(rest[j])) ++j;
        const std::string_view part = rest.substr(i, j - i);
        if (part == "..") {
            if (parts.empty()) fail(err::PathFileAccess);
            parts.pop_back();
        } else if (!part.empty() && part != ".") {
            parts.emplace_back(part);
        }
        i = j + 1;
    }
    return parts;
}

std::string homeDirectory() {
    if (const char* home = std::getenv("HOME"); home && *home) return home;
    // No HOME (a service, a cron job): ask the password database.
    std::vector<char> buf(16384);
    passwd pw{};
    passwd* found = nullptr;
    if (getpwuid_r(getuid(), &pw, buf.data(), buf.size(), &found) == 0 && found && found->pw_dir)
        return found->pw_dir;
    return ".";
}

}  // namespace

FileSystem::FileSystem(fs::path driveRoot) : root_(std::move(driveRoot)) {}

fs::path FileSystem::DefaultDriveRoot() {
    // XDG says a relative XDG_DATA_HOME is to be ignored.
    if (const char* xdg = std::getenv("XDG_DATA_HOME"); xdg && *xdg == '/')
        return fs::path(xdg) / "maroset" / "drive_c";
    return fs::path(homeDirectory()) / ".local" / "share" / "maroset" / "drive_c";
}

void FileSystem::setDriveRoot(fs::path root) {
    root_ = std::move(root);
}

fs::path FileSystem::resolve(std::string_view path) const {
    const std::vector<std::string> parts = splitDrivePath(path);
    std::error_code ec;
    fs::create_directories(root_, ec);
    if (ec) fail(err::PathFileAccess);
    fs::path native = root_;
    for (const std::string& part : parts) native /= part;
    return native;
}

bool FileSystem::FolderExists(std::string_view path) const {
    try {
        std::error_code ec;
        return fs::is_directory(resolve(path), ec);
    } catch (const VbError&) {
        return false;  // another drive, or outside the root: no such folder here
    }
}

bool FileSystem::FileExists(std::string_view path) const {
    try {
        std::error_code ec;
        return fs::is_regular_file(resolve(path), ec);
    } catch (const VbError&) {
        return false;
    }
}

void FileSystem::CreateFolder(std::string_view path) const {
    const fs::path native = resolve(path);
    std::error_code ec;
    if (fs::exists(native, ec)) fail(err::PathFileAccess);
    if (!fs::is_directory(native.parent_path(), ec)) fail(err::PathNotFound);
    if (!fs::create_directory(native, ec) || ec) fail(err::PathFileAccess);
}

void FileSystem::AppendText(std::string_view path, std::string_view bytes) const {
    const fs::path native = resolve(path);
    const int fd = ::open(native.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0666);
    if (fd < 0) fail(errno == ENOENT || errno == ENOTDIR ? err::PathNotFound : err::PathFileAccess);
    const char* p = bytes.data();
    size_t left = bytes.size();
    while (left > 0) {
        const ssize_t n = ::write(fd, p, left);
        if (n < 0) {
            if (errno == EINTR) continue;
            ::close(fd);
            fail(err::PathFileAccess);
        }
        p += n;
        left -= static_cast<size_t>(n);
    }
    if (::close(fd) != 0) fail(err::PathFileAccess);
}

}  // namespace maroset::platform
