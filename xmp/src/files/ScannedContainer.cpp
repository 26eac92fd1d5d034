// Any other file: packets are found by their markers. Each is checked,
// since the toolkit's handler may parse any of them. Such files are only
// read: without knowing the format, a write could not tell a packet that
// describes the file from one quoted inside it.
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

  bool PlanWrite(const FileReader&, const std::string&, WritePlan*, std::string* problem) const override {
    if (problem) *problem = "can be read but not written (" + mFormat + ")";
    return false;
  }

  bool Walk(const FileReader& file, std::string* problem) override {
    mNative = true;  // unknown: the toolkit's handler decides what there is
    mFormat = FormatOf(file.ReadText(0, std::min<std::uint64_t>(file.Size(), 512)));
    std::uint32_t packets = 0;
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
        if (marker == &kMarkers[0] && !mPacket) mPacket = extent;
        if (extent->End() >= pos + n) {
          next = extent->End();
          break;
        }
        i = static_cast<std::size_t>(extent->End() - pos);
      }
      pos = std::max(next, pos + 1);
    }
    // With several packets, which one describes the file is the toolkit's
    // handler's to say.
    if (packets != 1) mPacket.reset();
    return true;
  }

 private:
  // What people call the format, from the first bytes.
  static std::string FormatOf(const std::string& head) {
    const auto starts = [&](const char* magic, std::size_t length) { return head.compare(0, length, magic, length) == 0; };
    if (starts("%!PS", 4) || starts("\xC5\xD0\xD3\xC6", 4)) return "PostScript";
    if (starts("%PDF", 4)) return "PDF";
    if (starts("AT&TFORM", 8)) return "DjVu";
    if (starts("FLIF", 4)) return "FLIF";
    if (starts("\xFF\x0A", 2) || starts("\0\0\0\x0CJXL ", 8)) return "JPEG XL";
    if (head.compare(6, 8, "HEAPCCDR") == 0) return "CRW";
    if (starts("\x06\x06\xED\xF5\xD8\x1D\x46\xE5", 8)) return "InDesign";
    if (head.find("<svg") != std::string::npos) return "SVG";
    if (head.find("<?xml") != std::string::npos || head.find("<x:xmpmeta") != std::string::npos) return "XML";
    return "unknown format";
  }

  std::string mFormat;
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
