#pragma once

#include <filesystem>
#include <string>
#include <string_view>

namespace maroset::platform {

// Drive C: of the system's paths, mapped to a directory (the drive root). Paths stay as the
// system writes them ("C:\NUVDiskIO\Line1.mdb"); backslashes become slashes, "C:" (any case)
// or a leading backslash means the drive root, and a path without a drive is taken from the
// root as well. A path that would leave the drive root (through "..") or names another drive
// is refused with Path/File access error (75). Failures are VbErrors with the language's
// file error numbers (53 File not found, 75 Path/File access error, 76 Path not found).
class FileSystem {
  public:
    explicit FileSystem(std::filesystem::path driveRoot);

    // $XDG_DATA_HOME/maroset/drive_c, falling back to ~/.local/share/maroset/drive_c.
    static std::filesystem::path DefaultDriveRoot();

    const std::filesystem::path& driveRoot() const { return root_; }
    void setDriveRoot(std::filesystem::path root);

    // The native path of a path on drive C:. Creates the drive root if it is missing.
    std::filesystem::path resolve(std::string_view path) const;

    bool FolderExists(std::string_view path) const;
    bool FileExists(std::string_view path) const;
    // Creates one folder; its parent must exist (76 Path not found otherwise).
    void CreateFolder(std::string_view path) const;
    // Opens the file for appending (creating it), writes bytes and closes it.
    void AppendText(std::string_view path, std::string_view bytes) const;

  private:
    std::filesystem::path root_;
};

}  // namespace maroset::platform
