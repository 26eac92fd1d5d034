// ovrametadata: which container format the XMP toolkit sees in a media file
// (cached, since asking means opening the file), and the files that belong
// to a media file. Any thread may call these functions.
#pragma once

#include <vector>

#include <boost/date_time/posix_time/ptime.hpp>

#include <ovrametadata/Common.h>

namespace ovrametadata {
namespace utility {

// One cached detection: the toolkit's format code and the file's
// modification time (millisecond resolution) when it was detected.
struct FormatCacheInfo {
  XMP_FileFormat format = 0x20202020;
  boost::posix_time::ptime modified;
};

// The toolkit's format code of the file at path; 0x20202020 (unknown) for a
// missing file or one the toolkit cannot open. The answer is cached per
// path (exact, case-sensitive string) and reused while the file's
// modification time is unchanged; an unknown result is cached too.
OVRAMETADATA_EXPORT XMP_FileFormat GetXMPFormat(const UTF16String& path);

// Records a format for path unless the path is already cached (an existing
// entry is never overwritten: erase it first). A not-a-date-time `modified`
// means the file's current modification time; nothing is recorded when no
// valid time results (for instance for a missing file).
OVRAMETADATA_EXPORT void AddCachedXMPFormat(const UTF16String& path, XMP_FileFormat format,
                                            const boost::posix_time::ptime& modified);

// Forgets the cached format of path; no-op when there is none.
OVRAMETADATA_EXPORT void EraseCachedXMPFormat(const UTF16String& path);

// Appends to files (not cleared first) the files that make up the media
// file at path as the toolkit lists them (the file itself, then sidecars
// and resources). False, with whatever was appended so far, when the toolkit
// cannot handle the file; never throws.
OVRAMETADATA_EXPORT bool GetAssociatedFiles(const UTF16String& path,
                                            std::vector<UTF16String>& files);

// Removes the new files of writes still in progress in this process, which a
// write that ends normally never leaves behind. Async-signal-safe: meant
// for the host's SIGINT and SIGTERM handlers, before the process ends. (A
// write killed outright leaves at most one such hidden file, which the next
// write into the same folder removes.)
OVRAMETADATA_EXPORT void RemoveUnfinishedWrites() noexcept;

}  // namespace utility
}  // namespace ovrametadata
