// GIF: XMP lives in an application extension "XMP DataXMP" whose raw bytes
// are followed by a 258-byte "magic trailer" that lets any reader skip it
// as data sub-blocks, so the packet may take any length.
#include <cstring>

#include "Container.h"
#include "PacketScan.h"

namespace ovraxmp {
namespace detail {
namespace {

const char kApplication[] = "XMP DataXMP";  // 11 bytes, no NUL
constexpr std::uint64_t kTrailerSize = 258;

std::string MagicTrailer() {
  std::string trailer(1, '\x01');
  for (int b = 0xFF; b >= 0; --b) trailer += static_cast<char>(b);
  trailer += '\0';
  return trailer;
}

class GIFContainer : public Container {
 public:
  const char* Name() const override { return "GIF"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    unsigned char screen[7];
    if (!file.Read(6, screen, sizeof screen)) return Refuse(problem, "header cut short");
    std::uint64_t pos = 13;
    if (screen[4] & 0x80) pos += 3u << ((screen[4] & 7) + 1);
    mInsertAt = pos;
    std::uint64_t blocks = 0;
    unsigned char b[14];
    while (file.Read(pos, b, 1) && b[0] != 0x3B) {
      if (++blocks > kMaxParts) return Refuse(problem, "too many blocks");
      if (b[0] == 0x21) {
        if (!file.Read(pos, b, 2)) break;
        if (b[1] == 0xFF && file.Read(pos, b, 14) && b[2] == 11 && std::memcmp(b + 3, kApplication, 11) == 0) {
          const std::uint64_t start = pos + 14;
          const std::optional<std::uint64_t> end = FindTrailer(file, start);
          if (!end) return Refuse(problem, "XMP extension without its trailer");
          if (!mPacket && !TakePacket(file, {start, *end - start}, problem)) return false;
          pos = *end + kTrailerSize;
          continue;
        }
        pos += 2;
      } else if (b[0] == 0x2C) {
        unsigned char image[10];
        if (!file.Read(pos, image, 10)) break;
        pos += 10;
        if (image[9] & 0x80) pos += 3u << ((image[9] & 7) + 1);
        pos += 1;  // code size
      } else {
        break;  // not a block: damage, readers stop here too
      }
      if (!SkipSubBlocks(file, &pos)) break;
    }
    return true;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (packet.find('\0') != std::string::npos) return Refuse(problem, "the XMP packet holds NUL bytes");
    if (mPacket) {
      plan->Copy(0, mPacket->offset);
      plan->Insert(packet);
      plan->Copy(mPacket->End(), file.Size());
      return true;
    }
    // Extensions came with version 89a.
    CopyWithPatches(plan, mInsertAt, {{3, "89a"}});
    plan->Insert(std::string("\x21\xFF\x0B", 3) + kApplication + packet + MagicTrailer());
    plan->Copy(mInsertAt, file.Size());
    return true;
  }

 private:
  static bool SkipSubBlocks(const FileReader& file, std::uint64_t* pos) {
    unsigned char size;
    while (file.Read(*pos, &size, 1)) {
      *pos += 1 + std::uint64_t(size);
      if (size == 0) return true;
    }
    return false;
  }

  // Where the trailer after the packet at start begins (the first byte 1
  // followed by 0xFF, which UTF-8 text never holds).
  static std::optional<std::uint64_t> FindTrailer(const FileReader& file, std::uint64_t start) {
    const std::string trailer = MagicTrailer();
    std::string piece;
    for (std::uint64_t at = start; at < file.Size() && at - start <= kMaxPacketBytes;) {
      const std::uint64_t n = std::min<std::uint64_t>(1u << 20, file.Size() - at);
      piece = file.ReadText(at, n);
      const std::size_t hit = piece.find("\x01\xFF");
      if (hit != std::string::npos) {
        char check[kTrailerSize];
        if (!file.Read(at + hit, check, kTrailerSize) || std::memcmp(check, trailer.data(), kTrailerSize) != 0)
          return std::nullopt;
        return at + hit;
      }
      if (at + n >= file.Size()) break;
      at += n - 1;
    }
    return std::nullopt;
  }

  std::uint64_t mInsertAt = 13;
};

}  // namespace

std::unique_ptr<Container> MakeGIFContainer() { return std::make_unique<GIFContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
