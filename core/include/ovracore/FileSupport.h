// ovracore: files and folders on std::filesystem. Paths are UTF-16 at the
// interface, as the rest of the platform layer hands them out.
#pragma once

#include <chrono>
#include <filesystem>
#include <optional>
#include <stdexcept>
#include <vector>

#include <ovracore/Strings.h>

namespace ovracore {
namespace filesupport {

std::filesystem::path ToFSPath(const UTF16String& path);
UTF16String FromFSPath(const std::filesystem::path& path);

// Thrown only where the interface says so (the application-support roots).
class DirectoryException : public std::runtime_error {
 public:
  explicit DirectoryException(const std::string& message) : std::runtime_error(message) {}
};

class File {
 public:
  File() = default;
  explicit File(const UTF16String& path);
  explicit File(std::filesystem::path path);
  // Literals such as u"clip.mov" would fit both forms above.
  explicit File(const char16_t* path) : File(UTF16String(path)) {}

  bool Exists() const;                 // a regular file (or a link to one)
  UTF16String FullPath() const;        // absolute, lexically normalised
  UTF16String Name() const;            // "clip.mov"
  UTF16String Title() const;           // "clip"
  UTF16String Extension() const;       // ".mov" (empty when none)
  // Last modification time, absent when the file cannot be examined.
  std::optional<std::filesystem::file_time_type> ModificationTime() const;
  const std::filesystem::path& FSPath() const { return mPath; }

 private:
  std::filesystem::path mPath;
};

class Dir {
 public:
  Dir() = default;
  explicit Dir(const UTF16String& path);
  explicit Dir(std::filesystem::path path);
  explicit Dir(const char16_t* path) : Dir(UTF16String(path)) {}

  bool Exists() const;
  UTF16String FullPath() const;
  UTF16String Name() const;
  Dir SubDir(const UTF16String& relative) const;   // "a/b" joins both levels
  File FileNamed(const UTF16String& name) const;
  // Regular files directly in the folder, sorted by name; empty when the
  // folder cannot be read.
  std::vector<File> Files() const;
  std::vector<Dir> SubDirs() const;
  // Creates the folder with its parents; true when it exists afterwards.
  bool Create() const;
  const std::filesystem::path& FSPath() const { return mPath; }

 private:
  std::filesystem::path mPath;
};

// The per-user and machine-wide data roots. On Linux: $XDG_DATA_HOME (default
// ~/.local/share) and /usr/local/share; OVRAMETADATA_USER_ROOT and
// OVRAMETADATA_LOCAL_ROOT override them; an override that is set but empty,
// or no HOME for the user root, means there is no root. Neither creates the
// folder. Throws DirectoryException with
// "$$$/ovracore/filesupport/DirCommonFiles=Could not find the common files directory."
// when no root can be determined.
Dir ApplicationSupportFolder_User();
Dir ApplicationSupportFolder_Local();

// The application's plug-in folder: set by the host, by default a folder
// "plugins" beside the running library (the module this code is linked
// into). An empty path restores that default.
Dir PluginsFolder();
void SetPluginsFolder(const UTF16String& path);

namespace FileUtils {
// Creates the folder (with parents) when missing; false when that fails.
bool EnsureDirectoryExists(const Dir& dir);
}  // namespace FileUtils

// Whole-file helpers. Reading answers absent when the file cannot be read
// or is larger than maxBytes.
std::optional<std::string> ReadFileToString(const UTF16String& path,
                                            std::size_t maxBytes = 512u * 1024u * 1024u);
// Overwrites the file in place; false on failure.
bool SimpleWriteStringToFile(const File& file, std::string_view contents);
// Writes a temporary file in the target's folder, flushes it and renames it
// over the target, so that the target is either the old or the new content.
// A new file gets the permissions the umask allows, a replaced one keeps its
// own; a link is followed. On failure the temporary file is removed and the
// target is untouched.
bool SafeSave(const UTF16String& path, std::string_view contents);

}  // namespace filesupport
}  // namespace ovracore
