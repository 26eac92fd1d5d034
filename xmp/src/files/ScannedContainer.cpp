// Any other file: packets are found by their markers. Each is checked,
// since the toolkit's handler may parse any of them; one wrapped packet that
// allows writing (end="w") can be written in place, at its own length.
#include <algorithm>
#include <cstring>
#include <iterator>

#include "Container.h"
#include "PacketScan.h"

namespace ovraxmp {
namespace detail {
namespace {

constexpr std::uint32_t kMaxPacketsPerFile = 1000;
constexpr std::size_t kPiece = 1u << 20;

struct Marker {
  const char* start;
  std::size_t startLength;
  const char* end;
  std::size_t endLength;
};

const Marker kMarkers[] = {
    {"<?xpacket begin", 15, "<?xpacket end", 13},
    {"<\0?\0x\0p\0a\0c\0k\0e\0t\0 \0b\0", 22, "<\0?\0x\0p\0a\0c\0k\0e\0t\0 \0e\0n\0d\0", 26},
    {"<x:xmpmeta", 10, "</x:xmpmeta>", 12},
};

class ScannedContainer : public Container {
 public:
  const char* Name() const override { return "file"; }
  bool KnowsLayout() const override { return false; }

  bool Walk(const FileReader& file, std::string* problem) override {
    mNative = true;  // unknown: the toolkit's handler decides what there is
    std::uint32_t packets = 0;
    std::uint32_t writable = 0;
    std::string piece;
    std::uint64_t pos = 0;
    // A start marker with no end behind it means no later one of its kind
    // has one either: the rest of the file is read once per kind at most.
    bool endless[std::size(kMarkers)] = {};
    while (pos < file.Size()) {
      const std::uint64_t n = std::min<std::uint64_t>(kPiece, file.Size() - pos);
      piece = file.ReadText(pos, n);
      std::uint64_t next = pos + (n > 32 && pos + n < file.Size() ? n - 32 : n);
      for (std::size_t i = 0; (i = piece.find('<', i)) != std::string::npos;) {
        const Marker* marker = nullptr;
        for (const Marker& m : kMarkers)
          if (piece.compare(i, m.startLength, m.start, m.startLength) == 0) marker = &m;
        if (!marker || endless[marker - kMarkers]) {
          ++i;
          continue;
        }
        if (++packets > kMaxPacketsPerFile) return Refuse(problem, "too many XMP packets");
        const std::uint64_t start = pos + i;
        const std::optional<Extent> extent = PacketAt(file, start, *marker);
        if (!extent) {
          endless[marker - kMarkers] = true;
          --packets;  // no end: no packet the toolkit would take either
          ++i;
          continue;
        }
        const std::string text = file.ReadText(extent->offset, extent->length);
        std::string why;
        if (!ScanPacket(text, &why)) return Refuse(problem, "XMP packet at byte " + std::to_string(start) + ": " + why);
        const std::string ending = text.substr(text.size() > 32 ? text.size() - 32 : 0);
        if (marker == &kMarkers[0] && (ending.find("end=\"w\"") != std::string::npos ||
                                       ending.find("end='w'") != std::string::npos))
          ++writable;
        if (marker == &kMarkers[0] && !mPacket) mPacket = extent;
        if (extent->End() >= pos + n) {
          next = extent->End();
          break;
        }
        i = static_cast<std::size_t>(extent->End() - pos);
      }
      pos = std::max(next, pos + 1);
    }
    // Only a file with one packet, open for writing, is written in place.
    if (packets != 1 || writable != 1) mPacket.reset();
    return true;
  }

 private:
  // The packet from its start marker to the end of its end marker.
  static std::optional<Extent> PacketAt(const FileReader& file, std::uint64_t start, const Marker& marker) {
    std::string piece;
    for (std::uint64_t at = start; at < file.Size() && at - start <= kMaxPacketBytes;) {
      const std::uint64_t n = std::min<std::uint64_t>(kPiece, file.Size() - at);
      piece = file.ReadText(at, n);
      const std::size_t hit = piece.find(std::string(marker.end, marker.endLength));
      if (hit != std::string::npos) {
        std::uint64_t end = at + hit + marker.endLength;
        if (marker.end[1] == '?') {
          // The end marker runs to its "?>" (in the packet's encoding).
          const std::size_t close = piece.find(marker.endLength == 13 ? "?>" : std::string("?\0>", 3), hit);
          if (close == std::string::npos) return std::nullopt;
          end = at + close + (marker.endLength == 13 ? 2 : 4);
        }
        return Extent{start, end - start};
      }
      // Pieces overlap by the marker's length, so that none is missed.
      if (at + n >= file.Size()) break;
      at += n - marker.endLength;
    }
    return std::nullopt;
  }
};

}  // namespace

std::unique_ptr<Container> MakeScannedContainer() { return std::make_unique<ScannedContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
