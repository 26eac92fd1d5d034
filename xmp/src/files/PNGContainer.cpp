// PNG: a chain of chunks, each with its own checksum. XMP lives in an
// uncompressed iTXt chunk whose keyword names the XMP namespace's host.
#include <cstring>

#include <boost/crc.hpp>

#include <ovraxmp/XMPConsts.h>

#include "Container.h"

namespace ovraxmp {
namespace detail {
// "XML:", the host of the XMP namespaces with its labels reversed and
// without "ns", ".xmp".
const std::string& PNGPacketKeyword() {
  static const std::string keyword = [] {
    const std::string uri = kXMP_NS_XMP;
    const std::size_t hostStart = uri.find("//") + 2;
    std::string host = uri.substr(hostStart, uri.find('/', hostStart) - hostStart);
    std::string reversed;
    for (std::size_t dot; (dot = host.rfind('.')) != std::string::npos; host.erase(dot))
      reversed += host.substr(dot + 1) + ".";
    return "XML:" + reversed + "xmp";
  }();
  return keyword;
}

namespace {


class PNGContainer : public Container {
 public:
  const char* Name() const override { return "PNG"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    std::uint64_t pos = 8;
    std::uint64_t chunks = 0;
    while (pos + 12 <= file.Size()) {
      unsigned char head[8];
      if (!file.Read(pos, head, sizeof head)) break;
      const std::uint64_t length = BE32(head);
      if (length > 0x7FFFFFFFu) return Refuse(problem, "chunk with a broken length");
      if (pos + 12 + length > file.Size()) break;  // cut short
      if (++chunks > kMaxParts) return Refuse(problem, "too many chunks");
      if (pos == 8) {
        if (std::memcmp(head + 4, "IHDR", 4) != 0) return Refuse(problem, "no header chunk");
        mInsertAt = pos + 12 + length;
      }
      if (std::memcmp(head + 4, "iTXt", 4) == 0 && length > PNGPacketKeyword().size() + 1 && !mPacket &&
          !mCompressed) {
        if (!TakeText(file, pos + 8, length, problem)) return false;
        if (mPacket) mChunk = {pos, 12 + length};
      }
      if (std::memcmp(head + 4, "IEND", 4) == 0) break;
      pos += 12 + length;
    }
    if (mInsertAt == 0) return Refuse(problem, "no header chunk");
    return true;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (mCompressed) return Refuse(problem, "its XMP is compressed and is not written");
    // iTXt: keyword, no compression, no language, no translated keyword.
    std::string chunk = "iTXt" + PNGPacketKeyword();
    chunk.append(5, '\0');
    chunk += packet;
    if (chunk.size() - 4 > 0x7FFFFFFFu) return Refuse(problem, "the XMP packet is too large for a chunk");
    boost::crc_32_type crc;
    crc.process_bytes(chunk.data(), chunk.size());
    const std::uint64_t at = mPacket ? mChunk.offset : mInsertAt;
    plan->Copy(0, at);
    plan->Insert(PutBE32(static_cast<std::uint32_t>(chunk.size() - 4)) + chunk + PutBE32(crc.checksum()));
    plan->Copy(mPacket ? mChunk.End() : mInsertAt, file.Size());
    return true;
  }

 private:
  // The text of an iTXt chunk that carries XMP: keyword, compression flag
  // and method, language and translated keyword, each text NUL-ended.
  bool TakeText(const FileReader& file, std::uint64_t data, std::uint64_t length, std::string* problem) {
    const std::string& expected = PNGPacketKeyword();
    const std::size_t keywordSize = expected.size() + 1;  // with its NUL
    std::string keyword(keywordSize, '\0');
    if (!file.Read(data, keyword.data(), keywordSize) || keyword.compare(0, expected.size(), expected) != 0 ||
        keyword.back() != '\0')
      return true;
    const std::string rest = file.ReadText(data + keywordSize, length - keywordSize);
    if (rest.size() < 2) return true;
    if (rest[0] != 0) {
      mCompressed = true;
      return true;
    }
    const std::size_t language = rest.find('\0', 2);
    const std::size_t translated = language == std::string::npos ? language : rest.find('\0', language + 1);
    if (translated == std::string::npos) return true;
    const std::uint64_t start = data + keywordSize + translated + 1;
    return TakePacket(file, {start, data + length - start}, problem);
  }

  Extent mChunk;
  std::uint64_t mInsertAt = 0;  // just past the header chunk
  bool mCompressed = false;
};

}  // namespace

std::unique_ptr<Container> MakePNGContainer() { return std::make_unique<PNGContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
