// The minimal media files and ExifTool helpers of ../xmp/XMPMediaFiles.h
// under the names the provider, utility and tool tests use.
#pragma once

#include <string>

#include "../xmp/XMPMediaFiles.h"

namespace ovratest {
namespace media {

inline std::string MinimalJPEG() { return xmptest::media::Jpeg(); }
inline std::string MinimalWAV() { return xmptest::media::Wav(); }
inline std::string MinimalMP4() { return xmptest::media::Mp4(); }
using xmptest::media::ExifToolValue;
using xmptest::media::HaveExifTool;
using xmptest::media::RunCommand;

}  // namespace media
}  // namespace ovratest
