// ovracore: replacing a file so that no failure or interruption leaves
// anything but the old or the complete new content under its name.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace ovracore {
namespace filesupport {

// One replacement of one file: open the original (read it through ReadFD()
// while the new content is made), write the new content, commit. The new
// file lives beside the original, unnamed where the file system allows it,
// and takes the original's name in one rename after it is synced; the
// folder is synced after the rename.
//
// The new file gets the original's owner and group where the process may
// (set-user-ID and set-group-ID bits are dropped where it may not), its
// permission bits from the first byte on, and its extended attributes and
// access control lists. Writers in this library serialise on a lock of the
// original, so two replacements of one file never interleave.
//
// Every failure answers false with one line saying why in *problem (the
// system's reason included); the original is then left as it was. An
// object that is destroyed before Commit abandons the new file.
// Not thread-safe; different objects may be used on different threads.
class FileReplacement {
 public:
  FileReplacement() = default;
  ~FileReplacement();
  FileReplacement(const FileReplacement&) = delete;
  FileReplacement& operator=(const FileReplacement&) = delete;

  // Opens the regular file at utf8Path (a link is followed) for reading and
  // takes the lock. With mayCreate, a missing file is no failure: the
  // replacement then creates it with the permissions the umask allows.
  // Refuses files the process may not write (for the superuser: files
  // without any write permission bit).
  bool Open(const std::string& utf8Path, bool mayCreate, std::string* problem);
  // The original, open for reading; -1 when it did not exist.
  int ReadFD() const { return mOriginal; }
  std::uint64_t OriginalSize() const { return mOriginalSize; }
  const std::string& Path() const { return mPath; }

  // Starts the new file; expectedSize is checked against the process's
  // file-size limit before anything is written.
  bool Begin(std::uint64_t expectedSize, std::string* problem);
  bool Append(std::string_view bytes, std::string* problem);
  // Appends the original's bytes [from, to).
  bool AppendOriginal(std::uint64_t from, std::uint64_t to, std::string* problem);
  // Syncs the new file, renames it over the original and lets the next
  // writer of the file go on. Refused when the original was renamed away or
  // replaced since Open.
  bool Commit(std::string* problem);

 private:
  bool Fail(const std::string& what, int error, std::string* problem);
  bool CopyAttributes(std::string* problem);
  bool NameNewFile(std::string* problem);
  void Abandon() noexcept;

  std::string mPath;    // the file replaced (a link resolved)
  std::string mFolder;
  int mOriginal = -1;
  std::uint64_t mOriginalSize = 0;
  unsigned long long mDevice = 0, mInode = 0;
  unsigned mMode = 0, mUid = 0, mGid = 0;
  bool mExists = false;
  int mNew = -1;
  bool mUnnamed = false;  // the new file has no name yet
  std::string mNewName;   // its hidden name beside the original, once it has one
  int mPendingSlot = -1;  // its entry among the unfinished files
};

// Removes the named new files of replacements still in progress in this
// process. Async-signal-safe: meant for SIGINT and SIGTERM handlers, which
// then end the process.
void RemoveUnfinishedReplacements() noexcept;

}  // namespace filesupport
}  // namespace ovracore
