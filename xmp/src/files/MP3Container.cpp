// MP3: the ID3v2 tag in front of the audio holds the XMP in a PRIV frame
// owned by "XMP". A larger packet takes the tag's padding, or the tag grows
// and the audio behind it moves (MP3 audio is found by scanning, not by
// offsets).
#include <cstring>

#include "Container.h"

namespace ovraxmp {
namespace detail {
namespace {

const char kOwner[] = "XMP";  // + NUL
constexpr std::uint64_t kTagPadding = 1024;

std::uint32_t SyncSafe(const unsigned char* p) {
  return (std::uint32_t(p[0] & 0x7F) << 21) | (std::uint32_t(p[1] & 0x7F) << 14) | (std::uint32_t(p[2] & 0x7F) << 7) |
         (p[3] & 0x7F);
}
std::string PutSyncSafe(std::uint32_t v) {
  return {char((v >> 21) & 0x7F), char((v >> 14) & 0x7F), char((v >> 7) & 0x7F), char(v & 0x7F)};
}

class MP3Container : public Container {
 public:
  const char* Name() const override { return "MP3"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    mNative = true;  // the tag's other frames, an ID3v1 tag at the end
    unsigned char head[10];
    if (!file.Read(0, head, 10)) return Refuse(problem, "tag header cut short");
    mVersion = head[3];
    mFlags = head[5];
    mTagEnd = 10 + std::uint64_t(SyncSafe(head + 6));
    if (mTagEnd > file.Size()) return Refuse(problem, "tag runs past the file");
    // Version 2.2 has frames of another shape; unsynchronised or extended
    // tags are read by the toolkit's handler and not written.
    if (mVersion < 3 || mVersion > 4 || (mFlags & 0xC0)) {
      mWritable = false;
      return true;
    }
    std::uint64_t pos = 10;
    std::uint64_t frames = 0;
    mFramesEnd = pos;
    while (pos + 10 <= mTagEnd) {
      unsigned char frame[10];
      if (!file.Read(pos, frame, 10)) return Refuse(problem, "frame cut short");
      if (frame[0] == 0) break;  // padding
      if (++frames > kMaxParts) return Refuse(problem, "too many frames");
      const std::uint64_t size = mVersion == 4 ? SyncSafe(frame + 4) : BE32(frame + 4);
      if (pos + 10 + size > mTagEnd) return Refuse(problem, "frame runs past its tag");
      if (std::memcmp(frame, "PRIV", 4) == 0 && size > sizeof kOwner && !mPacket) {
        char owner[sizeof kOwner];
        if (file.Read(pos + 10, owner, sizeof owner) && std::memcmp(owner, kOwner, sizeof kOwner) == 0) {
          if (frame[9] != 0) {
            mWritable = false;  // compressed, encrypted or otherwise transformed
          } else {
            mFrame = {pos, 10 + size};
            if (!TakePacket(file, {pos + 10 + sizeof kOwner, size - sizeof kOwner}, problem)) return false;
          }
        }
      }
      pos += 10 + size;
      mFramesEnd = pos;
    }
    return true;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (!mWritable) return Refuse(problem, "this ID3 tag is not written");
    if (SameLengthInPlace(file, packet, plan)) return true;
    const std::uint64_t body = sizeof kOwner + packet.size();
    std::string frame = "PRIV" + (mVersion == 4 ? PutSyncSafe(static_cast<std::uint32_t>(body))
                                                 : PutBE32(static_cast<std::uint32_t>(body)));
    frame.append(2, '\0');
    frame.append(kOwner, sizeof kOwner);
    frame += packet;
    const std::uint64_t frames = mFramesEnd - 10 - (mPacket ? mFrame.length : 0) + frame.size();
    // The padding takes the growth when it can; the audio stays in place.
    const std::uint64_t tagSize = frames <= mTagEnd - 10 ? mTagEnd - 10 : frames + kTagPadding;
    if (tagSize >= (1u << 28) || body >= (1u << 28)) return Refuse(problem, "the ID3 tag would outgrow 256 MB");
    const std::uint64_t at = mPacket ? mFrame.offset : mFramesEnd;
    CopyWithPatches(plan, at, {{6, PutSyncSafe(static_cast<std::uint32_t>(tagSize))}});
    plan->Insert(std::move(frame));
    plan->Copy(mPacket ? mFrame.End() : mFramesEnd, mFramesEnd);
    plan->Insert(std::string(static_cast<std::size_t>(10 + tagSize - plan->Size()), '\0'));
    plan->Copy(mTagEnd, file.Size());
    return true;
  }

 private:
  unsigned char mVersion = 0, mFlags = 0;
  std::uint64_t mTagEnd = 0, mFramesEnd = 0;
  Extent mFrame;
  bool mWritable = true;
};

}  // namespace

std::unique_ptr<Container> MakeMP3Container() { return std::make_unique<MP3Container>(); }

}  // namespace detail
}  // namespace ovraxmp
