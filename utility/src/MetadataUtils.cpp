// The file-format cache and the associated files of a media file.
#include <ovrametadata/MetadataUtils.h>

#include <sys/stat.h>

#include <atomic>
#include <functional>
#include <map>
#include <string>
#include <utility>

#include <boost/date_time/posix_time/posix_time.hpp>
#include <boost/pool/pool_alloc.hpp>

#include <ovracore/Diagnostics.h>
#include <ovracore/SafeWrite.h>
#include <ovracore/FileSupport.h>
#include <ovracore/Mutex.h>
#include <ovracore/Strings.h>
#include <ovraxmp/XMPToolkit.h>

#include "MetadataUtilsInternal.h"

#include <ovracore/SafeWrite.h>

namespace ovrametadata {
namespace utility {

namespace {

constexpr XMP_FileFormat kUnknownFormat = ovraxmp::kXMP_UnknownFile;  // 0x20202020
// Read, XMP only, smart handler, limited scanning, and the toolkit's 0x400 bit.
constexpr ovraxmp::XMP_OptionBits kDetectionOpenFlags =
    ovraxmp::kXMPFiles_OpenForRead | ovraxmp::kXMPFiles_OpenOnlyXMP |
    ovraxmp::kXMPFiles_OpenUseSmartHandler | ovraxmp::kXMPFiles_OpenLimitedScanning |
    ovraxmp::kXMPFiles_OpenAllowBackgroundFileOpen;  // 0x4A5
constexpr ovraxmp::XMP_OptionBits kAssociatedResourcesOptions = 0x408;

// Nodes come from a recycling pool: entries are dropped and re-added each
// time a file changes.
using CacheAllocator =
    boost::fast_pool_allocator<std::pair<const UTF16String, FormatCacheInfo>>;
using FormatCache =
    std::map<UTF16String, FormatCacheInfo, std::less<UTF16String>, CacheAllocator>;

ovracore::RecursiveMutex sXMPFormatCacheCriticalSection;
std::atomic<std::uint64_t> sDetectionOpenCount{0};

// Never destroyed, so that no static destructor (of the pool or of a
// late caller) can outlive it.
FormatCache& XMPFormatCache() {
  static FormatCache* cache = new FormatCache;
  return *cache;
}

// Whether the path names a regular file (following links), and its
// modification time in milliseconds (not-a-date-time when it is not one).
// One stat call answers both: the cached lookup is dominated by it.
struct FileStatus {
  bool exists = false;
  boost::posix_time::ptime modified{boost::posix_time::not_a_date_time};
};

FileStatus ExamineFile(const UTF16String& path) {
  FileStatus result;
  struct stat status {};
  if (::stat(ovracore::filesupport::ToFSPath(path).c_str(), &status) != 0 ||
      !S_ISREG(status.st_mode)) {
    return result;
  }
  result.exists = true;
  result.modified = boost::posix_time::from_time_t(status.st_mtim.tv_sec) +
                    boost::posix_time::milliseconds(status.st_mtim.tv_nsec / 1000000);
  return result;
}

XMP_FileFormat DetectFormat(const UTF16String& path) {
  try {
    ++sDetectionOpenCount;
    ovraxmp::XMPFiles file(ovracore::ToUTF8(path), kUnknownFormat, kDetectionOpenFlags);
    XMP_FileFormat format = kUnknownFormat;
    file.GetFileInfo(nullptr, nullptr, &format);
    file.CloseFile(ovraxmp::kXMPFiles_NoOptions);
    return format;
  } catch (const ovraxmp::XMP_Error&) {
    return kUnknownFormat;
  } catch (...) {
    ovracore::RaiseAssertion({"false", "utility/src/MetadataUtils",
                              "XMP_FileFormat ovrametadata::utility::GetXMPFormat(const UTF16String &)",
                              "XMP Should not throw non-XMP Errors"});
    return kUnknownFormat;
  }
}

}  // namespace

XMP_FileFormat GetXMPFormat(const UTF16String& path) {
  const FileStatus file = ExamineFile(path);
  if (!file.exists) return kUnknownFormat;
  const boost::posix_time::ptime& modified = file.modified;
  {
    ovracore::LockGuard<ovracore::RecursiveMutex> lock(sXMPFormatCacheCriticalSection);
    FormatCache& cache = XMPFormatCache();
    const FormatCache::iterator found = cache.find(path);
    if (found != cache.end()) {
      if (found->second.modified == modified) return found->second.format;
      cache.erase(found);
    }
  }
  // The lock is not held while the toolkit opens the file: two threads may
  // detect the same file at once, and the first insertion wins.
  const XMP_FileFormat format = DetectFormat(path);
  AddCachedXMPFormat(path, format, modified);
  return format;
}

void AddCachedXMPFormat(const UTF16String& path, XMP_FileFormat format,
                        const boost::posix_time::ptime& modified) {
  boost::posix_time::ptime time = modified;
  if (time.is_not_a_date_time()) time = ExamineFile(path).modified;
  if (time.is_special()) return;
  ovracore::LockGuard<ovracore::RecursiveMutex> lock(sXMPFormatCacheCriticalSection);
  XMPFormatCache().emplace(path, FormatCacheInfo{format, time});
}

void EraseCachedXMPFormat(const UTF16String& path) {
  ovracore::LockGuard<ovracore::RecursiveMutex> lock(sXMPFormatCacheCriticalSection);
  XMPFormatCache().erase(path);
}

void RemoveUnfinishedWrites() noexcept { ovracore::filesupport::RemoveUnfinishedReplacements(); }

bool GetAssociatedFiles(const UTF16String& path, std::vector<UTF16String>& files) {
  try {
    const XMP_FileFormat format = GetXMPFormat(path);
    std::vector<std::string> resources;
    if (!ovraxmp::XMPFiles::GetAssociatedResources(ovracore::ToUTF8(path), &resources, format,
                                                   kAssociatedResourcesOptions)) {
      return false;
    }
    for (const std::string& resource : resources) files.push_back(ovracore::ToUTF16(resource));
    return true;
  } catch (...) {
    return false;
  }
}

namespace detail {

std::uint64_t FormatDetectionOpenCount() { return sDetectionOpenCount.load(); }

boost::optional<FormatCacheInfo> CachedXMPFormat(const UTF16String& path) {
  ovracore::LockGuard<ovracore::RecursiveMutex> lock(sXMPFormatCacheCriticalSection);
  const FormatCache& cache = XMPFormatCache();
  const FormatCache::const_iterator found = cache.find(path);
  if (found == cache.end()) return boost::none;
  return found->second;
}

}  // namespace detail

}  // namespace utility
}  // namespace ovrametadata
