// Replacing files on Linux: an unnamed new file (O_TMPFILE) where the file
// system has them, so that a killed writer leaves nothing behind; a hidden
// named one beside the original elsewhere.
#include <ovracore/SafeWrite.h>

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <functional>
#include <mutex>
#include <random>
#include <set>
#include <system_error>
#include <vector>

namespace ovracore {
namespace filesupport {
namespace {

std::string ErrorText(int error) { return std::generic_category().message(error); }

// The permission bits a newly created file gets under the process umask,
// read without changing it (umask(2) has no read-only form).
unsigned NewFileMode() {
  unsigned mask = 022;
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.compare(0, 6, "Umask:") == 0) {
      mask = static_cast<unsigned>(std::strtoul(line.c_str() + 6, nullptr, 8));
      break;
    }
  }
  return 0666u & ~mask;
}

bool WriteAll(int fd, const char* data, std::size_t length) {
  while (length > 0) {
    const ssize_t written = ::write(fd, data, length);
    if (written < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    data += written;
    length -= static_cast<std::size_t>(written);
  }
  return true;
}

// ---- New files not yet renamed, for the signal handlers ----

constexpr std::size_t kPendingSlots = 32;
struct PendingSlot {
  std::atomic<int> state{0};  // 0 free, 1 being filled, 2 holds a name
  char name[PATH_MAX];
};
std::array<PendingSlot, kPendingSlots> sPending;

int RegisterPending(const std::string& name) {
  if (name.size() >= PATH_MAX) return -1;
  for (std::size_t i = 0; i < kPendingSlots; ++i) {
    int expected = 0;
    if (sPending[i].state.compare_exchange_strong(expected, 1)) {
      std::memcpy(sPending[i].name, name.c_str(), name.size() + 1);
      sPending[i].state.store(2);
      return static_cast<int>(i);
    }
  }
  return -1;  // all taken: that file is only cleaned by a later write
}

void ReleasePending(int slot) {
  if (slot >= 0) sPending[static_cast<std::size_t>(slot)].state.store(0);
}

// ---- Names of new files: ".NAME.ovra-HOST-PID-RANDOM" ----

const std::string& HostTag() {
  static const std::string tag = [] {
    char host[256] = {};
    ::gethostname(host, sizeof host - 1);
    char text[9];
    std::snprintf(text, sizeof text, "%08x", static_cast<unsigned>(std::hash<std::string>()(host) & 0xFFFFFFFFu));
    return std::string(text);
  }();
  return tag;
}

std::string NewFileName(const std::string& folder, const std::string& name) {
  thread_local std::mt19937_64 random{std::random_device{}()};
  static const char kLetters[] = "abcdefghijklmnopqrstuvwxyz0123456789";
  std::string suffix;
  for (int i = 0; i < 6; ++i) suffix += kLetters[random() % (sizeof kLetters - 1)];
  return folder + "/." + name + ".ovra-" + HostTag() + "-" + std::to_string(::getpid()) + "-" + suffix;
}

// Removes, once per folder and process, the new files that writes of this
// user on this machine left behind when they were killed: their process is
// gone, so nobody will finish them.
void RemoveStaleNewFiles(const std::string& folder) {
  static std::mutex mutex;
  static std::set<std::string> done;
  {
    const std::lock_guard<std::mutex> lock(mutex);
    if (!done.insert(folder).second) return;
  }
  DIR* dir = ::opendir(folder.c_str());
  if (!dir) return;
  const std::string marker = ".ovra-" + HostTag() + "-";
  while (const dirent* entry = ::readdir(dir)) {
    const std::string name = entry->d_name;
    const std::size_t at = name.rfind(marker);
    if (name[0] != '.' || at == std::string::npos) continue;
    const long pid = std::strtol(name.c_str() + at + marker.size(), nullptr, 10);
    struct stat info {};
    if (pid <= 0 || ::fstatat(::dirfd(dir), name.c_str(), &info, AT_SYMLINK_NOFOLLOW) != 0) continue;
    if (!S_ISREG(info.st_mode) || info.st_uid != ::geteuid()) continue;
    if (::kill(static_cast<pid_t>(pid), 0) == 0 || errno != ESRCH) continue;
    ::unlinkat(::dirfd(dir), name.c_str(), 0);
  }
  ::closedir(dir);
}

bool CanNameUnnamedFiles() {
  static const bool can = ::access("/proc/self/fd", X_OK) == 0;
  return can;
}

}  // namespace

void RemoveUnfinishedReplacements() noexcept {
  for (PendingSlot& slot : sPending) {
    if (slot.state.load() == 2) ::unlink(slot.name);
  }
}

FileReplacement::~FileReplacement() {
  Abandon();
  if (mOriginal >= 0) ::close(mOriginal);
}

void FileReplacement::Abandon() noexcept {
  if (mNew >= 0) ::close(mNew);
  mNew = -1;
  if (!mNewName.empty()) ::unlink(mNewName.c_str());
  mNewName.clear();
  ReleasePending(mPendingSlot);
  mPendingSlot = -1;
}

bool FileReplacement::Fail(const std::string& what, int error, std::string* problem) {
  if (problem) *problem = error != 0 ? what + ": " + ErrorText(error) : what;
  Abandon();
  return false;
}

bool FileReplacement::Open(const std::string& utf8Path, bool mayCreate, std::string* problem) {
  char resolved[PATH_MAX];
  std::string path = ::realpath(utf8Path.c_str(), resolved) ? std::string(resolved) : utf8Path;
  // A writer that held the lock may have renamed a new file over the one
  // opened here; the lock is then taken again on the file now named.
  for (int attempt = 0; attempt < 8; ++attempt) {
    const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY);
    if (fd < 0) {
      if (errno == ENOENT && mayCreate) break;
      return Fail("cannot open the file", errno, problem);
    }
    struct stat info {};
    if (::fstat(fd, &info) != 0) {
      const int error = errno;
      ::close(fd);
      return Fail("cannot examine the file", error, problem);
    }
    if (!S_ISREG(info.st_mode)) {
      ::close(fd);
      return Fail("not a regular file", 0, problem);
    }
    if (::faccessat(AT_FDCWD, path.c_str(), W_OK, AT_EACCESS) != 0 ||
        (::geteuid() == 0 && (info.st_mode & 0222) == 0)) {
      ::close(fd);
      return Fail("the file is not writable", EACCES, problem);
    }
    while (::flock(fd, LOCK_EX) != 0) {
      if (errno != EINTR) {
        const int error = errno;
        ::close(fd);
        return Fail("cannot lock the file", error, problem);
      }
    }
    struct stat now {};
    if (::stat(path.c_str(), &now) == 0 && now.st_dev == info.st_dev && now.st_ino == info.st_ino) {
      mOriginal = fd;
      mOriginalSize = static_cast<std::uint64_t>(info.st_size);
      mDevice = info.st_dev;
      mInode = info.st_ino;
      mMode = info.st_mode & 07777;
      mUid = info.st_uid;
      mGid = info.st_gid;
      mExists = true;
      break;
    }
    ::close(fd);
  }
  if (!mExists && !mayCreate) return Fail("the file keeps being replaced by other writers", 0, problem);
  if (!mExists) mMode = NewFileMode();
  mPath = path;
  const std::size_t slash = path.rfind('/');
  mFolder = slash == std::string::npos ? "." : slash == 0 ? "/" : path.substr(0, slash);
  return true;
}

bool FileReplacement::Begin(std::uint64_t expectedSize, std::string* problem) {
  Abandon();
  struct rlimit limit {};
  // A write past the limit would end the process with SIGXFSZ.
  if (::getrlimit(RLIMIT_FSIZE, &limit) == 0 && limit.rlim_cur != RLIM_INFINITY && expectedSize > limit.rlim_cur)
    return Fail("the new file would exceed the file size limit", EFBIG, problem);
  RemoveStaleNewFiles(mFolder);
  mUnnamed = false;
  if (CanNameUnnamedFiles()) {
    mNew = ::open(mFolder.c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, 0600);
    mUnnamed = mNew >= 0;
  }
  if (mNew < 0) {
    const std::size_t slash = mPath.rfind('/');
    const std::string name = slash == std::string::npos ? mPath : mPath.substr(slash + 1);
    for (int attempt = 0; attempt < 16 && mNew < 0; ++attempt) {
      mNewName = NewFileName(mFolder, name);
      mNew = ::open(mNewName.c_str(), O_CREAT | O_EXCL | O_WRONLY | O_CLOEXEC | O_NOCTTY, 0600);
      if (mNew < 0 && errno != EEXIST) break;
    }
    if (mNew < 0) {
      const int error = errno;
      mNewName.clear();
      return Fail("cannot create a new file in its folder", error, problem);
    }
    mPendingSlot = RegisterPending(mNewName);
  }
  return CopyAttributes(problem);
}

bool FileReplacement::CopyAttributes(std::string* problem) {
  unsigned mode = mMode;
  if (mExists && (mUid != ::geteuid() || mGid != ::getegid())) {
    if (::fchown(mNew, mUid, mGid) != 0) {
      mode &= ~static_cast<unsigned>(S_ISUID);
      if (::fchown(mNew, static_cast<uid_t>(-1), mGid) != 0) mode &= ~static_cast<unsigned>(S_ISGID);
    }
  }
  if (::fchmod(mNew, mode) != 0) return Fail("cannot set the permissions of the new file", errno, problem);
  if (!mExists) return true;
  // Extended attributes, access control lists among them (set after the
  // mode, whose group bits they own).
  std::vector<char> names(4096);
  ssize_t length;
  while ((length = ::flistxattr(mOriginal, names.data(), names.size())) < 0 && errno == ERANGE)
    names.resize(names.size() * 2);
  if (length < 0) {
    if (errno == ENOTSUP) return true;
    return Fail("cannot list the extended attributes of the file", errno, problem);
  }
  std::vector<char> value, present;
  for (ssize_t at = 0; at < length; at += static_cast<ssize_t>(std::strlen(names.data() + at)) + 1) {
    const char* name = names.data() + at;
    ssize_t size = ::fgetxattr(mOriginal, name, nullptr, 0);
    if (size < 0) return Fail(std::string("cannot read the extended attribute ") + name, errno, problem);
    value.resize(static_cast<std::size_t>(size) + 1);
    size = ::fgetxattr(mOriginal, name, value.data(), value.size());
    if (size < 0) return Fail(std::string("cannot read the extended attribute ") + name, errno, problem);
    // Labels the system gives every new file may already be right.
    present.resize(value.size());
    const ssize_t have = ::fgetxattr(mNew, name, present.data(), present.size());
    if (have == size && std::memcmp(present.data(), value.data(), static_cast<std::size_t>(size)) == 0) continue;
    if (::fsetxattr(mNew, name, value.data(), static_cast<std::size_t>(size), 0) != 0)
      return Fail(std::string("cannot keep the extended attribute ") + name, errno, problem);
  }
  return true;
}

bool FileReplacement::Append(std::string_view bytes, std::string* problem) {
  if (mNew < 0) return Fail("no new file", EBADF, problem);
  if (!WriteAll(mNew, bytes.data(), bytes.size())) return Fail("cannot write the new file", errno, problem);
  return true;
}

bool FileReplacement::AppendOriginal(std::uint64_t from, std::uint64_t to, std::string* problem) {
  if (mNew < 0 || mOriginal < 0) return Fail("no new file", EBADF, problem);
  loff_t at = static_cast<loff_t>(from);
  bool kernelCopy = true;
  std::vector<char> buffer;
  while (static_cast<std::uint64_t>(at) < to) {
    const std::size_t want = static_cast<std::size_t>(std::min<std::uint64_t>(to - static_cast<std::uint64_t>(at), 1u << 30));
    ssize_t done;
    if (kernelCopy) {
      done = ::copy_file_range(mOriginal, &at, mNew, nullptr, want, 0);
      if (done < 0 && (errno == EXDEV || errno == ENOSYS || errno == EINVAL || errno == EOPNOTSUPP)) {
        kernelCopy = false;
        continue;
      }
      if (done < 0 && errno == EINTR) continue;
      if (done < 0) return Fail("cannot copy the file", errno, problem);
    } else {
      buffer.resize(std::min<std::size_t>(want, 1u << 20));
      done = ::pread(mOriginal, buffer.data(), std::min(want, buffer.size()), at);
      if (done < 0 && errno == EINTR) continue;
      if (done < 0) return Fail("cannot read the file", errno, problem);
      if (!WriteAll(mNew, buffer.data(), static_cast<std::size_t>(done)))
        return Fail("cannot write the new file", errno, problem);
      at += done;
    }
    if (done == 0) return Fail("the file was cut short while it was read", 0, problem);
  }
  return true;
}

bool FileReplacement::NameNewFile(std::string* problem) {
  if (!mUnnamed) return true;
  const std::size_t slash = mPath.rfind('/');
  const std::string name = slash == std::string::npos ? mPath : mPath.substr(slash + 1);
  const std::string self = "/proc/self/fd/" + std::to_string(mNew);
  for (int attempt = 0; attempt < 16; ++attempt) {
    mNewName = NewFileName(mFolder, name);
    mPendingSlot = RegisterPending(mNewName);
    if (::linkat(AT_FDCWD, self.c_str(), AT_FDCWD, mNewName.c_str(), AT_SYMLINK_FOLLOW) == 0) {
      mUnnamed = false;
      return true;
    }
    const int error = errno;
    ReleasePending(mPendingSlot);
    mPendingSlot = -1;
    mNewName.clear();
    if (error != EEXIST) return Fail("cannot name the new file", error, problem);
  }
  return Fail("cannot name the new file", EEXIST, problem);
}

bool FileReplacement::Commit(std::string* problem) {
  if (mNew < 0) return Fail("no new file", EBADF, problem);
  if (::fsync(mNew) != 0) return Fail("cannot sync the new file", errno, problem);
  if (!NameNewFile(problem)) return false;
  if (mExists) {
    struct stat now {};
    if (::lstat(mPath.c_str(), &now) != 0 || now.st_dev != mDevice || now.st_ino != mInode)
      return Fail("the file was moved or replaced while it was being written", 0, problem);
  }
  if (::rename(mNewName.c_str(), mPath.c_str()) != 0) return Fail("cannot replace the file", errno, problem);
  // The new content is in place: nothing below may count as a failure.
  mNewName.clear();
  ReleasePending(mPendingSlot);
  mPendingSlot = -1;
  ::close(mNew);
  mNew = -1;
  // Writers waiting for the lock go on, with the file now named.
  if (mOriginal >= 0) ::close(mOriginal);
  mOriginal = -1;
  // Makes the rename itself durable.
  const int folder = ::open(mFolder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (folder >= 0) {
    ::fsync(folder);
    ::close(folder);
  }
  return true;
}

}  // namespace filesupport
}  // namespace ovracore
