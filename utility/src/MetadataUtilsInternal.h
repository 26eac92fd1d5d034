// Not part of the interface: observation points of the format cache, for
// the tests and benchmarks.
#pragma once

#include <cstdint>

#include <boost/optional.hpp>

#include <ovrametadata/MetadataUtils.h>

namespace ovrametadata {
namespace utility {
namespace detail {

// How many times the toolkit was asked to open a file to detect its format
// since the process started.
std::uint64_t FormatDetectionOpenCount();

// The cache entry of path, if any.
boost::optional<FormatCacheInfo> CachedXMPFormat(const UTF16String& path);

}  // namespace detail
}  // namespace utility
}  // namespace ovrametadata
