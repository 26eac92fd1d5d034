#include <ovracore/FileSupport.h>

#include <ovracore/SafeWrite.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <mutex>
#include <sstream>

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace ovracore {
namespace filesupport {

namespace fs = std::filesystem;

namespace {

constexpr const char* kDirCommonFilesMessage =
    "$$$/ovracore/filesupport/DirCommonFiles=Could not find the common files directory.";

fs::path Normalised(const fs::path& path) {
  std::error_code ec;
  fs::path absolute = fs::absolute(path, ec);
  if (ec) absolute = path;
  return absolute.lexically_normal();
}

// A root from an override variable: unset means "not overridden", set but
// empty means the host wants no root at all.
std::optional<fs::path> OverrideRoot(const char* variable) {
  const char* value = std::getenv(variable);
  if (!value) return std::nullopt;
  if (!*value) throw DirectoryException(kDirCommonFilesMessage);
  return fs::path(value);
}

struct PluginsSetting {
  std::mutex mutex;
  std::optional<fs::path> path;
};

PluginsSetting& sPluginsSetting() {
  static PluginsSetting setting;
  return setting;
}

fs::path ModuleFolder() {
  // The module that contains this code: the shared library when the platform
  // layer is linked into one, else the program.
  Dl_info info{};
  if (dladdr(reinterpret_cast<const void*>(&ModuleFolder), &info) != 0 && info.dli_fname &&
      *info.dli_fname) {
    return Normalised(fs::path(info.dli_fname)).parent_path();
  }
  std::error_code ec;
  const fs::path exe = fs::read_symlink("/proc/self/exe", ec);
  return ec ? fs::current_path(ec) : exe.parent_path();
}

}  // namespace

fs::path ToFSPath(const UTF16String& path) { return fs::path(ToUTF8(path)); }

UTF16String FromFSPath(const fs::path& path) { return ToUTF16(path.string()); }

// ---------------------------------------------------------------------- File

File::File(const UTF16String& path) : mPath(ToFSPath(path)) {}
File::File(fs::path path) : mPath(std::move(path)) {}

bool File::Exists() const {
  std::error_code ec;
  return !mPath.empty() && fs::is_regular_file(mPath, ec);
}

UTF16String File::FullPath() const { return mPath.empty() ? UTF16String() : FromFSPath(Normalised(mPath)); }
UTF16String File::Name() const { return FromFSPath(mPath.filename()); }
UTF16String File::Title() const { return FromFSPath(mPath.stem()); }
UTF16String File::Extension() const { return FromFSPath(mPath.extension()); }

std::optional<fs::file_time_type> File::ModificationTime() const {
  std::error_code ec;
  const fs::file_time_type time = fs::last_write_time(mPath, ec);
  if (ec) return std::nullopt;
  return time;
}

// ----------------------------------------------------------------------- Dir

Dir::Dir(const UTF16String& path) : mPath(ToFSPath(path)) {}
Dir::Dir(fs::path path) : mPath(std::move(path)) {}

bool Dir::Exists() const {
  std::error_code ec;
  return !mPath.empty() && fs::is_directory(mPath, ec);
}

UTF16String Dir::FullPath() const { return mPath.empty() ? UTF16String() : FromFSPath(Normalised(mPath)); }

UTF16String Dir::Name() const {
  // "a/b/" names "b", as "a/b" does.
  const fs::path normal = mPath.lexically_normal();
  const fs::path name = normal.has_filename() ? normal.filename() : normal.parent_path().filename();
  return FromFSPath(name);
}

Dir Dir::SubDir(const UTF16String& relative) const { return Dir(mPath / ToFSPath(relative)); }
File Dir::FileNamed(const UTF16String& name) const { return File(mPath / ToFSPath(name)); }

std::vector<File> Dir::Files() const {
  std::vector<fs::path> paths;
  std::error_code ec;
  for (fs::directory_iterator it(mPath, ec), end; !ec && it != end; it.increment(ec)) {
    std::error_code typeError;
    if (it->is_regular_file(typeError)) paths.push_back(it->path());
  }
  std::sort(paths.begin(), paths.end());
  return std::vector<File>(paths.begin(), paths.end());
}

std::vector<Dir> Dir::SubDirs() const {
  std::vector<fs::path> paths;
  std::error_code ec;
  for (fs::directory_iterator it(mPath, ec), end; !ec && it != end; it.increment(ec)) {
    std::error_code typeError;
    if (it->is_directory(typeError)) paths.push_back(it->path());
  }
  std::sort(paths.begin(), paths.end());
  return std::vector<Dir>(paths.begin(), paths.end());
}

bool Dir::Create() const {
  if (mPath.empty()) return false;
  std::error_code ec;
  fs::create_directories(mPath, ec);
  return Exists();
}

// --------------------------------------------------------------------- Roots

Dir ApplicationSupportFolder_User() {
  if (const std::optional<fs::path> root = OverrideRoot("OVRAMETADATA_USER_ROOT")) return Dir(*root);
  // A relative XDG_DATA_HOME is invalid and to be ignored.
  const char* xdg = std::getenv("XDG_DATA_HOME");
  if (xdg && *xdg && fs::path(xdg).is_absolute()) return Dir(fs::path(xdg));
  const char* home = std::getenv("HOME");
  if (!home || !*home) throw DirectoryException(kDirCommonFilesMessage);
  return Dir(fs::path(home) / ".local" / "share");
}

Dir ApplicationSupportFolder_Local() {
  if (const std::optional<fs::path> root = OverrideRoot("OVRAMETADATA_LOCAL_ROOT")) return Dir(*root);
  return Dir(fs::path("/usr/local/share"));
}

Dir PluginsFolder() {
  PluginsSetting& setting = sPluginsSetting();
  std::lock_guard<std::mutex> lock(setting.mutex);
  if (!setting.path) setting.path = ModuleFolder() / "plugins";
  return Dir(*setting.path);
}

void SetPluginsFolder(const UTF16String& path) {
  PluginsSetting& setting = sPluginsSetting();
  std::lock_guard<std::mutex> lock(setting.mutex);
  // An empty path restores the default next to the module.
  if (path.empty()) {
    setting.path.reset();
  } else {
    setting.path = ToFSPath(path);
  }
}

namespace FileUtils {
bool EnsureDirectoryExists(const Dir& dir) { return dir.Exists() || dir.Create(); }
}  // namespace FileUtils

// -------------------------------------------------------------- Whole files

std::optional<std::string> ReadFileToString(const UTF16String& path, std::size_t maxBytes) {
  const fs::path fsPath = ToFSPath(path);
  std::error_code ec;
  if (!fs::is_regular_file(fsPath, ec)) return std::nullopt;
  const std::uintmax_t size = fs::file_size(fsPath, ec);
  if (ec || size > maxBytes) return std::nullopt;
  std::ifstream in(fsPath, std::ios::binary);
  if (!in) return std::nullopt;
  std::string contents;
  contents.resize(static_cast<std::size_t>(size));
  in.read(contents.data(), static_cast<std::streamsize>(size));
  contents.resize(static_cast<std::size_t>(in.gcount()));
  // The file may have grown since it was measured; read the rest, capped.
  char extra[4096];
  while (in.read(extra, sizeof extra) || in.gcount() > 0) {
    contents.append(extra, static_cast<std::size_t>(in.gcount()));
    if (contents.size() > maxBytes) return std::nullopt;
  }
  if (in.bad()) return std::nullopt;
  return contents;
}

bool SimpleWriteStringToFile(const File& file, std::string_view contents) {
  std::ofstream out(file.FSPath(), std::ios::binary | std::ios::trunc);
  if (!out) return false;
  out.write(contents.data(), static_cast<std::streamsize>(contents.size()));
  out.close();
  return !out.fail();
}

bool SafeSave(const UTF16String& path, std::string_view contents) {
  FileReplacement replacement;
  const std::string target = ToUTF8(path);
  return !target.empty() && replacement.Open(target, true, nullptr) &&
         replacement.Begin(contents.size(), nullptr) && replacement.Append(contents, nullptr) &&
         replacement.Commit(nullptr);
}

}  // namespace filesupport
}  // namespace ovracore
