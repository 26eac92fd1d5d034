// JPEG: the segments up to the image data. XMP lives in an APP1 segment
// with the XMP namespace as its signature; Extended XMP continues it in
// further APP1 segments. EXIF (APP1) and IPTC (APP13) are the native
// metadata.
#include <algorithm>
#include <cstring>
#include <map>

#include "Container.h"
#include "PacketScan.h"

namespace ovraxmp {
namespace detail {
namespace {

const char kXMPSignature[] = "http://ns.adobe.com/xap/1.0/";             // + NUL
const char kExtendedSignature[] = "http://ns.adobe.com/xmp/extension/";  // + NUL
// A segment holds 65535 bytes with its length field and the signature.
constexpr std::size_t kMaxStandardPacket = 65535 - 2 - sizeof kXMPSignature;

class JPEGContainer : public Container {
 public:
  const char* Name() const override { return "JPEG"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    struct Chunk {
      std::uint32_t offset;
      std::uint32_t length;
      std::uint64_t fileOffset;
    };
    struct Group {
      std::uint32_t fullLength = 0;
      std::vector<Chunk> chunks;
    };
    std::map<std::string, Group> extended;
    std::uint64_t pos = 2;
    std::uint64_t segments = 0;
    bool leading = true;  // still in the APP0/APP1 run after the start marker
    mInsertAt = 2;
    while (pos + 4 <= file.Size()) {
      unsigned char head[4];
      if (!file.Read(pos, head, 1) || head[0] != 0xFF) break;  // image data or damage
      // Fill bytes may precede a marker; a long run of them is damage.
      int fill = 0;
      while (file.Read(pos + 1, head + 1, 1) && head[1] == 0xFF && ++fill < 64) ++pos;
      if (head[1] == 0xFF) break;
      const unsigned char marker = head[1];
      if (marker == 0xD9 || marker == 0xDA) break;
      if ((marker >= 0xD0 && marker <= 0xD7) || marker == 0x01 || marker == 0xD8) {
        pos += 2;
        continue;
      }
      if (++segments > kMaxParts) return Refuse(problem, "too many segments");
      if (!file.Read(pos + 2, head + 2, 2)) break;
      const std::uint32_t length = BE16(head + 2);
      if (length < 2) return Refuse(problem, "segment with a broken length");
      if (pos + 2 + length > file.Size()) break;  // cut short: readers stop there too
      const std::uint64_t content = pos + 4;
      const std::uint32_t size = length - 2;
      unsigned char sig[sizeof kExtendedSignature] = {};
      const std::size_t have = std::min<std::size_t>(sizeof sig, size);
      if (have > 0 && !file.Read(content, sig, have)) break;
      const auto signed_ = [&](const char* signature, std::size_t n) {
        return have >= n && std::memcmp(sig, signature, n) == 0;
      };
      if (marker == 0xE1 && signed_(kXMPSignature, sizeof kXMPSignature)) {
        if (!mPacket) {
          mSegment = {pos, 2 + std::uint64_t(length)};
          if (!TakePacket(file, {content + sizeof kXMPSignature, size - sizeof kXMPSignature}, problem))
            return false;
        }
      } else if (marker == 0xE1 && signed_(kExtendedSignature, sizeof kExtendedSignature)) {
        constexpr std::uint32_t kHeader = sizeof kExtendedSignature + 32 + 4 + 4;
        if (size < kHeader) return Refuse(problem, "Extended XMP segment too short");
        unsigned char fields[40];
        if (!file.Read(content + sizeof kExtendedSignature, fields, sizeof fields)) break;
        Group& group = extended[std::string(reinterpret_cast<char*>(fields), 32)];
        const std::uint32_t full = BE32(fields + 32);
        if (!group.chunks.empty() && group.fullLength != full)
          return Refuse(problem, "Extended XMP chunks disagree on the length");
        group.fullLength = full;
        group.chunks.push_back({BE32(fields + 36), size - kHeader, content + kHeader});
        mExtended.push_back({pos, 2 + std::uint64_t(length)});
      } else if ((marker == 0xE1 && signed_("Exif\0", 5)) || (marker == 0xED && signed_("Photoshop 3.0", 13))) {
        mNative = true;
      }
      if (leading && (marker == 0xE0 || (marker == 0xE1 && signed_("Exif\0", 5))))
        mInsertAt = pos + 2 + length;
      else
        leading = false;
      pos += 2 + length;
    }
    for (auto& entry : extended) {
      Group& group = entry.second;
      if (group.fullLength > kMaxPacketBytes)
        return Refuse(problem, "Extended XMP larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB");
      std::sort(group.chunks.begin(), group.chunks.end(),
                [](const Chunk& a, const Chunk& b) { return a.offset < b.offset; });
      // Only an exact tiling is a packet; anything else would be assembled
      // differently by every reader.
      std::uint64_t expected = 0;
      for (const Chunk& chunk : group.chunks) {
        if (chunk.offset != expected) return Refuse(problem, "Extended XMP chunks do not fit together");
        expected += chunk.length;
      }
      if (expected != group.fullLength) return Refuse(problem, "Extended XMP is incomplete");
      if (expected == 0) return Refuse(problem, "Extended XMP is empty");
      std::string whole;
      for (const Chunk& chunk : group.chunks) whole += file.ReadText(chunk.fileOffset, chunk.length);
      std::string why;
      if (!ScanPacket(whole, &why)) return Refuse(problem, "Extended XMP: " + why);
    }
    // The toolkit's handler joins Extended XMP to the packet for reading.
    if (!mExtended.empty()) mNative = true;
    return true;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (!mExtended.empty()) return Refuse(problem, "files with Extended XMP are not written");
    if (SameLengthInPlace(file, packet, plan)) return true;
    if (packet.size() > kMaxStandardPacket)
      return Refuse(problem, "the XMP packet would be larger than one JPEG segment holds");
    const std::uint64_t at = mPacket ? mSegment.offset : mInsertAt;
    const std::uint64_t resume = mPacket ? mSegment.End() : mInsertAt;
    std::string segment = "\xFF\xE1";
    const std::size_t length = 2 + sizeof kXMPSignature + packet.size();
    segment += static_cast<char>(length >> 8);
    segment += static_cast<char>(length & 0xFF);
    segment.append(kXMPSignature, sizeof kXMPSignature);
    segment += packet;
    plan->Copy(0, at);
    plan->Insert(std::move(segment));
    plan->Copy(resume, file.Size());
    return true;
  }

 private:
  Extent mSegment;             // the whole APP1 segment of the packet
  std::uint64_t mInsertAt = 2;  // where a new XMP segment goes
  std::vector<Extent> mExtended;  // the segments of Extended XMP
};

}  // namespace

std::unique_ptr<Container> MakeJPEGContainer() { return std::make_unique<JPEGContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
