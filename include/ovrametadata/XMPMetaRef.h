// ovrametadata: the handle of an XMP packet and the file-format code, as the
// XMP toolkit layer defines them. Kept apart so that the toolkit layer can
// share them without the rest of the interface.
#pragma once

#include <cstdint>

namespace ovraxmp {
class XMPPacket;  // the toolkit layer's packet object (opaque here)
}

// Handle of an XMP packet: reference-counted by the toolkit layer, passed by
// value. A null handle is legal everywhere and reads as "no packet".
using XMPMetaRef = ovraxmp::XMPPacket*;
// The toolkit's four-character file-format code; 0x20202020 is "unknown".
using XMP_FileFormat = std::uint32_t;
