// RIFF files (WAV, AVI, WebP): a tree of chunks. WAV and AVI keep XMP in a
// "_PMX" chunk, WebP in "XMP ". AVI indexes reach the media through
// offsets, so a larger packet is appended at the end of the RIFF form and
// the old chunk becomes "JUNK"; only the form's size changes.
#include <cstring>

#include "Container.h"

namespace ovraxmp {
namespace detail {
namespace {

class RIFFContainer : public Container {
 public:
  const char* Name() const override { return mWebP ? "WebP" : mAVI ? "AVI" : "WAV"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    unsigned char head[12];
    if (!file.Read(0, head, 12)) return Refuse(problem, "header cut short");
    mRF64 = std::memcmp(head, "RF64", 4) == 0;
    mWebP = std::memcmp(head + 8, "WEBP", 4) == 0;
    mAVI = std::memcmp(head + 8, "AVI ", 4) == 0;
    mFormEnd = mRF64 ? file.Size() : std::min<std::uint64_t>(8 + std::uint64_t(LE32(head + 4)), file.Size());
    std::uint64_t chunks = 0;
    return WalkChunks(file, 12, mFormEnd, 1, &chunks, problem);
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (SameLengthInPlace(file, packet, plan)) return true;
    if (mRF64) return Refuse(problem, "RF64 files are written only when the packet keeps its length");
    std::string chunk = (mWebP ? "XMP " : "_PMX") + PutLE32(static_cast<std::uint32_t>(packet.size())) + packet;
    if (packet.size() & 1) chunk += '\0';
    if (mWebP) {
      // No offsets in WebP: the chunk is replaced where it is.
      if (!mPacket) return Refuse(problem, "XMP is added to WebP files only by image editors");
      return Replace(file, mChunk, std::move(chunk), plan, problem);
    }
    if (mPacket && mChunk.End() >= mFormEnd && mFormEnd == file.Size())
      return Replace(file, mChunk, std::move(chunk), plan, problem);
    if (mFormEnd != file.Size()) return Refuse(problem, "data follows the RIFF form");
    const std::uint64_t form = file.Size() + (file.Size() & 1) + chunk.size() - 8;
    if (form > 0xFFFFFFFFu) return Refuse(problem, "the file would outgrow 4 GB");
    std::vector<std::pair<std::uint64_t, std::string>> patches;
    patches.emplace_back(4, PutLE32(static_cast<std::uint32_t>(form)));
    if (mPacket) {
      patches.emplace_back(mChunk.offset, "JUNK");
      patches.emplace_back(mPacket->offset, std::string(mPacket->length, '\0'));
    }
    CopyWithPatches(plan, file.Size(), std::move(patches));
    plan->Insert(std::string(file.Size() & 1, '\0') + chunk);
    return true;
  }

 private:
  bool WalkChunks(const FileReader& file, std::uint64_t pos, std::uint64_t end, int depth, std::uint64_t* chunks,
                  std::string* problem) {
    if (depth > kMaxContainerDepth) return Refuse(problem, "chunks nested too deeply");
    while (pos + 8 <= end) {
      unsigned char head[12];
      if (!file.Read(pos, head, 8)) return true;
      std::uint64_t size = LE32(head + 4);
      // Recordings cut short are common: read what is there.
      if (size > end - pos - 8) size = end - pos - 8;
      if (++*chunks > kMaxParts) return Refuse(problem, "too many chunks");
      const bool list = std::memcmp(head, "LIST", 4) == 0;
      if (list && size >= 4) {
        unsigned char type[4];
        if (depth == 1 && file.Read(pos + 8, type, 4) && std::memcmp(type, "INFO", 4) == 0) mNative = true;
        if (!WalkChunks(file, pos + 12, pos + 8 + size, depth + 1, chunks, problem)) return false;
      } else if (depth == 1 && std::memcmp(head, mWebP ? "XMP " : "_PMX", 4) == 0 && !mPacket) {
        mChunk = {pos, 8 + size + (size & 1)};
        if (mChunk.End() > end) mChunk.length = end - pos;
        if (!TakePacket(file, {pos + 8, size}, problem)) return false;
      } else if (depth == 1 && !mWebP) {
        static const char* const kNative[] = {"bext", "cart", "iXML", "DISP", "id3 ", "ID3 ", "strd"};
        for (const char* id : kNative)
          if (std::memcmp(head, id, 4) == 0) mNative = true;
      }
      pos += 8 + size + (size & 1);
    }
    return true;
  }

  bool Replace(const FileReader& file, const Extent& old, std::string chunk, WritePlan* plan,
               std::string* problem) const {
    const std::uint64_t form = mFormEnd - 8 - old.length + chunk.size();
    if (form > 0xFFFFFFFFu) return Refuse(problem, "the file would outgrow 4 GB");
    CopyWithPatches(plan, old.offset, {{4, PutLE32(static_cast<std::uint32_t>(form))}});
    plan->Insert(std::move(chunk));
    plan->Copy(old.End(), file.Size());
    return true;
  }

  Extent mChunk;
  std::uint64_t mFormEnd = 0;
  bool mRF64 = false, mWebP = false, mAVI = false;
};

}  // namespace

std::unique_ptr<Container> MakeRIFFContainer() { return std::make_unique<RIFFContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
