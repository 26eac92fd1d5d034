// TIFF and the formats built on it (DNG and most camera raw files): the
// first image file directory holds the XMP as tag 700. Every other value is
// reached through offsets, so a larger packet goes to the end of the file
// and only the tag's count and offset change; a directory that needs a new
// entry is written anew at the end and the header points to it.
#include <algorithm>
#include <cstring>
#include <vector>

#include "Container.h"

namespace ovraxmp {
namespace detail {
namespace {

constexpr std::uint16_t kXMPTag = 700;
constexpr std::uint64_t kMaxEntries = 4096;

class TIFFContainer : public Container {
 public:
  const char* Name() const override { return "TIFF"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    mNative = true;  // the directory's own tags, EXIF, IPTC
    unsigned char head[16] = {};
    if (!file.Read(0, head, 8)) return Refuse(problem, "header cut short");
    mLittle = head[0] == 'I';
    mBig = U16(head + 2) == 43;
    if (mBig) {
      if (!file.Read(0, head, 16) || U16(head + 4) != 8) return Refuse(problem, "broken BigTIFF header");
      mIFD = U64(head + 8);
    } else {
      mIFD = U32(head + 4);
    }
    const std::uint64_t countSize = mBig ? 8 : 2;
    unsigned char count[8];
    if (mIFD < (mBig ? 16u : 8u) || !file.Read(mIFD, count, countSize))
      return Refuse(problem, "first directory outside the file");
    mEntries = mBig ? U64(count) : U16(count);
    if (mEntries == 0 || mEntries > kMaxEntries) return Refuse(problem, "first directory with a broken size");
    const std::uint64_t entrySize = mBig ? 20 : 12;
    mTable = mIFD + countSize;
    mTableEnd = mTable + mEntries * entrySize + (mBig ? 8 : 4);  // with the next directory's offset
    if (mTableEnd > file.Size()) return Refuse(problem, "first directory outside the file");
    for (std::uint64_t i = 0; i < mEntries; ++i) {
      unsigned char entry[20];
      const std::uint64_t at = mTable + i * entrySize;
      if (!file.Read(at, entry, entrySize)) return Refuse(problem, "first directory cut short");
      if (U16(entry) != kXMPTag) continue;
      const std::uint64_t length = mBig ? U64(entry + 4) : U32(entry + 4);
      const std::uint64_t inlineSize = mBig ? 8 : 4;
      const std::uint64_t offset = length <= inlineSize ? at + (mBig ? 12 : 8) : (mBig ? U64(entry + 12) : U32(entry + 8));
      if (offset > file.Size() || length > file.Size() - offset) return Refuse(problem, "XMP tag outside the file");
      mEntry = at;
      if (length > inlineSize && !TakePacket(file, {offset, length}, problem)) return false;
      break;
    }
    return true;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (SameLengthInPlace(file, packet, plan)) return true;
    // The packet goes to the end, on a word boundary; the old one is blanked
    // so that no reader finds stale metadata.
    std::uint64_t end = file.Size();
    const std::string pad = end % 2 ? std::string(1, '\0') : std::string();
    const std::uint64_t packetAt = end + pad.size();
    end = packetAt + packet.size();
    if (!mBig && end > 0xFFFFFFFFu) return Refuse(problem, "the file would outgrow 4 GB");
    std::vector<std::pair<std::uint64_t, std::string>> patches;
    if (mPacket) patches.emplace_back(mPacket->offset, std::string(mPacket->length, ' '));
    if (mEntry) {
      patches.emplace_back(*mEntry + 4, mBig ? Put64(packet.size()) + Put64(packetAt)
                                             : Put32(static_cast<std::uint32_t>(packet.size())) +
                                                   Put32(static_cast<std::uint32_t>(packetAt)));
      CopyWithPatches(plan, file.Size(), std::move(patches));
      plan->Insert(pad + packet);
      return true;
    }
    // No XMP tag yet: the first directory is written again at the end with
    // one more entry, in tag order.
    const std::uint64_t entrySize = mBig ? 20 : 12;
    std::string table = file.ReadText(mTable, mTableEnd - mTable);
    std::string entry = Put16(kXMPTag) + Put16(1);  // BYTE
    entry += mBig ? Put64(packet.size()) + Put64(packetAt)
                  : Put32(static_cast<std::uint32_t>(packet.size())) + Put32(static_cast<std::uint32_t>(packetAt));
    std::uint64_t index = 0;
    while (index < mEntries && U16(reinterpret_cast<const unsigned char*>(table.data()) + index * entrySize) < kXMPTag)
      ++index;
    table.insert(static_cast<std::size_t>(index * entrySize), entry);
    const std::string align = end % 2 ? std::string(1, '\0') : std::string();
    const std::uint64_t ifdAt = end + align.size();
    if (!mBig && ifdAt + table.size() + 2 > 0xFFFFFFFFu) return Refuse(problem, "the file would outgrow 4 GB");
    const std::string directory = (mBig ? Put64(mEntries + 1) : Put16(static_cast<std::uint16_t>(mEntries + 1))) + table;
    patches.emplace_back(mBig ? 8 : 4, mBig ? Put64(ifdAt) : Put32(static_cast<std::uint32_t>(ifdAt)));
    CopyWithPatches(plan, file.Size(), std::move(patches));
    plan->Insert(pad + packet + align + directory);
    return true;
  }

 private:
  std::uint16_t U16(const unsigned char* p) const { return mLittle ? LE16(p) : BE16(p); }
  std::uint32_t U32(const unsigned char* p) const { return mLittle ? LE32(p) : BE32(p); }
  std::uint64_t U64(const unsigned char* p) const { return mLittle ? LE64(p) : BE64(p); }
  std::string Put16(std::uint16_t v) const {
    return mLittle ? std::string{char(v & 0xFF), char(v >> 8)} : std::string{char(v >> 8), char(v & 0xFF)};
  }
  std::string Put32(std::uint32_t v) const { return mLittle ? PutLE32(v) : PutBE32(v); }
  std::string Put64(std::uint64_t v) const {
    const std::string low = Put32(static_cast<std::uint32_t>(v)), high = Put32(static_cast<std::uint32_t>(v >> 32));
    return mLittle ? low + high : high + low;
  }

  bool mLittle = true;
  bool mBig = false;
  std::uint64_t mIFD = 0, mEntries = 0, mTable = 0, mTableEnd = 0;
  std::optional<std::uint64_t> mEntry;  // the XMP tag's entry
};

}  // namespace

std::unique_ptr<Container> MakeTIFFContainer() { return std::make_unique<TIFFContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
