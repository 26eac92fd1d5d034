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
    std::map<std::string, Group>& extended = mGroups;
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
    return true;
  }

  std::optional<std::size_t> PacketLimit() const override { return kMaxStandardPacket; }

  // The Extended XMP the packet names by its digest (xmpNote:HasExtendedXMP).
  std::optional<std::string> ExtensionText(const FileReader& file) const override {
    if (!mPacket || mGroups.empty()) return std::nullopt;
    const std::string packet = PacketText(file);
    const std::size_t note = packet.find("HasExtendedXMP");
    if (note == std::string::npos) return std::nullopt;
    for (const auto& [guid, group] : mGroups) {
      if (packet.find(guid, note) == std::string::npos) continue;
      std::string whole;
      for (const Chunk& chunk : group.chunks) whole += file.ReadText(chunk.fileOffset, chunk.length);
      return whole;
    }
    return std::nullopt;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (!mNewExtension && SameLengthInPlace(file, packet, plan)) return true;
    if (packet.size() > kMaxStandardPacket)
      return Refuse(problem, "the XMP packet would be larger than one JPEG segment holds");
    std::string segments = Segment(std::string(kXMPSignature, sizeof kXMPSignature) + packet);
    // Segments that go: the old packet's, and the old extension's when a new
    // one (or none) takes its place.
    std::vector<Extent> gone;
    if (mPacket) gone.push_back(mSegment);
    if (mNewExtension) {
      gone.insert(gone.end(), mExtended.begin(), mExtended.end());
      segments += ExtensionSegments(*mNewExtension);
    }
    std::sort(gone.begin(), gone.end(), [](const Extent& a, const Extent& b) { return a.offset < b.offset; });
    const std::uint64_t at = mPacket ? mSegment.offset : mInsertAt;
    std::uint64_t from = 0;
    bool placed = false;
    for (const Extent& segment : gone) {
      if (!placed && at <= segment.offset) {
        plan->Copy(from, at);
        plan->Insert(segments);
        from = at;
        placed = true;
      }
      plan->Copy(from, segment.offset);
      from = segment.End();
    }
    if (!placed) {
      plan->Copy(from, at);
      plan->Insert(std::move(segments));
      from = at;
    }
    plan->Copy(from, file.Size());
    return true;
  }

 private:
  struct Chunk {
    std::uint32_t offset;
    std::uint32_t length;
    std::uint64_t fileOffset;
  };
  struct Group {
    std::uint32_t fullLength = 0;
    std::vector<Chunk> chunks;
  };

  static std::string Segment(const std::string& content) {
    const std::size_t length = 2 + content.size();
    return std::string("\xFF\xE1", 2) + static_cast<char>(length >> 8) + static_cast<char>(length & 0xFF) + content;
  }

  // Extended XMP in segments: signature, the digest as 32 hexadecimal
  // digits, the full length and the offset of each piece.
  static std::string ExtensionSegments(const std::string& extension) {
    if (extension.empty()) return std::string();
    std::string segments;
    const std::string digest = ExtensionDigest(extension);
    constexpr std::size_t kPiece = 65400;
    for (std::size_t offset = 0; offset < extension.size(); offset += kPiece) {
      segments += Segment(std::string(kExtendedSignature, sizeof kExtendedSignature) + digest +
                          PutBE32(static_cast<std::uint32_t>(extension.size())) +
                          PutBE32(static_cast<std::uint32_t>(offset)) + extension.substr(offset, kPiece));
    }
    return segments;
  }

  std::map<std::string, Group> mGroups;  // Extended XMP by digest
  Extent mSegment;             // the whole APP1 segment of the packet
  std::uint64_t mInsertAt = 2;  // where a new XMP segment goes
  std::vector<Extent> mExtended;  // the segments of Extended XMP
};

}  // namespace

std::unique_ptr<Container> MakeJPEGContainer() { return std::make_unique<JPEGContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
