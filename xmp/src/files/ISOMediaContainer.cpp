// ISO base media files (MP4, QuickTime): a tree of boxes. MPEG-4 files keep
// XMP in a top-level uuid box, QuickTime movies in moov/udta/XMP_. The
// media samples are found through absolute offsets (stco, co64), so a
// larger packet either takes a free box beside it, or its old box becomes
// free space and a new one is appended; a movie box that grows moves the
// media behind it, whose offsets are then corrected.
#include <algorithm>
#include <cstring>
#include <set>
#include <vector>

#include "Container.h"

namespace ovraxmp {
namespace detail {
namespace {

const char kXMPUuid[16] = {'\xBE', '\x7A', '\xCF', '\xCB', '\x97', '\xA9', '\x42', '\xE8',
                           '\x9C', '\x71', '\x99', '\x94', '\x91', '\xE3', '\xAF', '\xAC'};
constexpr std::uint64_t kMaxMovieBox = 64u << 20;  // read whole to be rewritten

struct Box {
  char type[5] = {};
  std::uint64_t offset = 0, size = 0, header = 8;
  int parent = -1;
  bool toEnd = false;  // its size field is 0: it runs to the end of its parent
  std::uint64_t End() const { return offset + size; }
  bool Is(const char* t) const { return std::memcmp(type, t, 4) == 0; }
};

bool IsContainerBox(const Box& box) {
  static const char* const kContainers[] = {"moov", "trak", "mdia", "minf", "stbl", "udta", "edts", "dinf",
                                            "mvex", "moof", "traf", "mfra", "tref", "ilst", "meta"};
  return std::any_of(std::begin(kContainers), std::end(kContainers), [&](const char* c) { return box.Is(c); });
}

std::string BoxHeader(std::uint64_t size, const char* type) { return PutBE32(static_cast<std::uint32_t>(size)) + type; }

class ISOMediaContainer : public Container {
 public:
  const char* Name() const override { return mQuickTime ? "QuickTime" : "MPEG-4"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    mNative = true;  // movie header, user data
    if (!WalkBoxes(file, 0, file.Size(), 0, -1, problem)) return false;
    for (std::size_t i = 0; i < mBoxes.size(); ++i) {
      const Box& box = mBoxes[i];
      if (box.parent == -1 && box.Is("ftyp") && box.size >= box.header + 4) {
        char brand[4];
        if (file.Read(box.offset + box.header, brand, 4)) mQuickTime = std::memcmp(brand, "qt  ", 4) == 0;
      }
      if (box.parent == -1 && box.Is("moov") && !mMovie) mMovie = static_cast<int>(i);
    }
    if (mBoxes.empty() || mBoxes.front().Is("moov")) mQuickTime = mQuickTime || !mBoxes.empty();
    if (mMovie) {
      for (std::size_t i = 0; i < mBoxes.size(); ++i)
        if (mBoxes[i].parent == *mMovie && mBoxes[i].Is("udta") && !mUserData) mUserData = static_cast<int>(i);
    }
    // The box readers look at first for this kind of file.
    std::optional<int> uuid, xmp;
    for (std::size_t i = 0; i < mBoxes.size(); ++i) {
      const Box& box = mBoxes[i];
      if (box.parent == -1 && box.Is("uuid") && mUuidXMP.count(i) && !uuid) uuid = static_cast<int>(i);
      if (mUserData && box.parent == *mUserData && box.Is("XMP_") && !xmp) xmp = static_cast<int>(i);
    }
    mXMPBox = mQuickTime ? (xmp ? xmp : uuid) : (uuid ? uuid : xmp);
    if (!mXMPBox) return true;
    const Box& box = mBoxes[static_cast<std::size_t>(*mXMPBox)];
    const std::uint64_t skip = box.Is("uuid") ? 16 : 0;
    return TakePacket(file, {box.offset + box.header + skip, box.size - box.header - skip}, problem);
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (SameLengthInPlace(file, packet, plan)) return true;
    const bool inMovie = mXMPBox ? mBoxes[static_cast<std::size_t>(*mXMPBox)].Is("XMP_") : mQuickTime;
    return inMovie ? PlanMovieGrowth(file, packet, plan, problem) : PlanTopLevel(file, packet, plan, problem);
  }

 private:
  bool WalkBoxes(const FileReader& file, std::uint64_t pos, std::uint64_t end, int depth, int parent,
                 std::string* problem) {
    if (depth > kMaxContainerDepth) return Refuse(problem, "boxes nested too deeply");
    while (pos < end) {
      if (end - pos < 8) {
        if (depth == 0) return true;  // trailing bytes after the last box
        return Refuse(problem, "box with a broken size");
      }
      unsigned char head[16];
      if (!file.Read(pos, head, 8)) return Refuse(problem, "box header cut short");
      Box box;
      std::memcpy(box.type, head + 4, 4);
      box.offset = pos;
      box.parent = parent;
      box.size = BE32(head);
      if (box.size == 1) {
        if (end - pos < 16 || !file.Read(pos + 8, head + 8, 8)) return Refuse(problem, "box with a broken size");
        box.size = BE64(head + 8);
        box.header = 16;
      } else if (box.size == 0) {
        box.size = end - pos;
        box.toEnd = true;
      }
      if (box.size < box.header) return Refuse(problem, std::string("box \"") + box.type + "\" with a broken size");
      if (box.size > end - pos) {
        // A cut-off download leaves the media data short; anything else
        // that overruns its parent is damage readers would misread.
        if (depth == 0 && box.Is("mdat")) {
          mTruncated = true;
          return true;
        }
        return Refuse(problem, std::string("box \"") + box.type + "\" runs past its parent");
      }
      if (mBoxes.size() >= kMaxParts) return Refuse(problem, "too many boxes");
      const int index = static_cast<int>(mBoxes.size());
      mBoxes.push_back(box);
      const std::uint64_t body = pos + box.header;
      if (box.Is("uuid")) {
        char uuid[16];
        if (box.size - box.header >= 16 && file.Read(body, uuid, 16) && std::memcmp(uuid, kXMPUuid, 16) == 0)
          mUuidXMP.insert(static_cast<std::size_t>(index));
      } else if (box.Is("moof") || box.Is("sidx") || (depth == 0 && box.Is("meta"))) {
        mOffsetsElsewhere = true;  // fragments and item locations we do not correct
      }
      if (IsContainerBox(box)) {
        std::uint64_t children = body;
        if (box.Is("meta") && box.size - box.header >= 4) {
          // An ISO meta box starts with version and flags; a QuickTime one
          // with its first child.
          unsigned char versionFlags[4];
          if (file.Read(body, versionFlags, 4) && BE32(versionFlags) == 0) children += 4;
        }
        if (!WalkBoxes(file, children, pos + box.size, depth + 1, index, problem)) return false;
      }
      pos += box.size;
    }
    return true;
  }

  // MPEG-4: the XMP box at the top level.
  bool PlanTopLevel(const FileReader& file, const std::string& packet, WritePlan* plan, std::string* problem) const {
    std::string box = BoxHeader(8 + 16 + packet.size(), "uuid") + std::string(kXMPUuid, 16) + packet;
    if (packet.size() > 0xFFFFFFFFu - 24) return Refuse(problem, "the XMP packet is too large for a box");
    if (mXMPBox) {
      const std::size_t index = static_cast<std::size_t>(*mXMPBox);
      const Box& old = mBoxes[index];
      // Free space right behind the box takes the growth.
      for (std::size_t i = index + 1; i < mBoxes.size(); ++i) {
        const Box& next = mBoxes[i];
        if (next.parent != -1) continue;
        if (next.offset == old.End() && (next.Is("free") || next.Is("skip")) && !next.toEnd) {
          const std::uint64_t room = old.size + next.size;
          if (room == box.size() || (room > box.size() && room - box.size() >= 8)) {
            plan->Copy(0, old.offset);
            plan->Insert(box);
            if (room > box.size()) plan->Insert(BoxHeader(room - box.size(), "free") + std::string(room - box.size() - 8, '\0'));
            plan->Copy(next.End(), file.Size());
            return true;
          }
        }
        break;
      }
      if (old.End() == file.Size() && !mTruncated) {
        plan->Copy(0, old.offset);
        plan->Insert(std::move(box));
        return true;
      }
    }
    return AppendBox(file, std::move(box), plan, problem);
  }

  // The old XMP box, if any, becomes free space; the new box goes last.
  bool AppendBox(const FileReader& file, std::string box, WritePlan* plan, std::string* problem) const {
    if (mTruncated) return Refuse(problem, "the media data is cut short");
    std::vector<std::pair<std::uint64_t, std::string>> patches;
    if (mXMPBox) {
      const Box& old = mBoxes[static_cast<std::size_t>(*mXMPBox)];
      if (old.parent != -1) return Refuse(problem, "the XMP box is not where it can be freed");
      patches.emplace_back(old.offset + 4, "free");
      patches.emplace_back(old.offset + old.header, std::string(old.size - old.header, '\0'));
    }
    for (auto it = mBoxes.rbegin(); it != mBoxes.rend(); ++it) {
      if (it->parent != -1) continue;
      if (it->toEnd) {
        // A box that runs to the end of the file must say where it ends.
        if (it->header != 8 || it->size > 0xFFFFFFFFu) return Refuse(problem, "the last box has no size");
        patches.emplace_back(it->offset, PutBE32(static_cast<std::uint32_t>(it->size)));
      }
      break;
    }
    CopyWithPatches(plan, file.Size(), std::move(patches));
    plan->Insert(std::move(box));
    return true;
  }

  // QuickTime: the XMP_ box in moov/udta grows, and with it the movie box;
  // the sample offsets of media behind the movie box move along.
  bool PlanMovieGrowth(const FileReader& file, const std::string& packet, WritePlan* plan,
                       std::string* problem) const {
    if (!mMovie) return Refuse(problem, "no movie box");
    const Box& movie = mBoxes[static_cast<std::size_t>(*mMovie)];
    if (movie.size > kMaxMovieBox) return Refuse(problem, "the movie box is too large to rewrite");
    if (packet.size() > 0xFFFFFFFFu - 8) return Refuse(problem, "the XMP packet is too large for a box");
    std::string box = BoxHeader(8 + packet.size(), "XMP_") + packet;
    const Box* old = mXMPBox ? &mBoxes[static_cast<std::size_t>(*mXMPBox)] : nullptr;
    const Box* userData = mUserData ? &mBoxes[static_cast<std::size_t>(*mUserData)] : nullptr;
    if (!userData) box = BoxHeader(8 + box.size(), "udta") + box;
    const std::int64_t delta = static_cast<std::int64_t>(box.size()) - static_cast<std::int64_t>(old ? old->size : 0);
    const bool mediaBehind = movie.End() < file.Size();
    if (mediaBehind && (mOffsetsElsewhere || mTruncated))
      return Refuse(problem, "the movie box cannot grow in front of fragmented or cut media");

    std::string moov = file.ReadText(movie.offset, movie.size);
    if (mediaBehind) {
      for (const Box& table : mBoxes) {
        if (!(table.Is("stco") || table.Is("co64")) || table.offset < movie.offset || table.End() > movie.End())
          continue;
        if (!ShiftOffsets(&moov, table, movie, delta)) return Refuse(problem, "a sample offset would overflow");
      }
    }
    const auto resize = [&](const Box& b) {
      const std::uint64_t size = b.size + static_cast<std::uint64_t>(delta);
      const std::size_t at = static_cast<std::size_t>(b.offset - movie.offset);
      if (b.header == 16) {
        const std::string wide = PutBE32(static_cast<std::uint32_t>(size >> 32)) + PutBE32(static_cast<std::uint32_t>(size));
        moov.replace(at + 8, 8, wide);
        return true;
      }
      if (size > 0xFFFFFFFFu) return false;
      moov.replace(at, 4, PutBE32(static_cast<std::uint32_t>(size)));
      return true;
    };
    if (old) {
      moov.replace(static_cast<std::size_t>(old->offset - movie.offset), static_cast<std::size_t>(old->size), box);
    } else if (userData) {
      moov.insert(static_cast<std::size_t>(userData->End() - movie.offset), box);
    } else {
      moov += box;
    }
    if ((userData && !resize(*userData)) || !resize(movie)) return Refuse(problem, "the movie box would outgrow 4 GB");
    if (movie.toEnd && movie.header == 8) moov.replace(0, 4, PutBE32(0));
    plan->Copy(0, movie.offset);
    plan->Insert(std::move(moov));
    plan->Copy(movie.End(), file.Size());
    return true;
  }

  // Adds delta to each chunk offset in the table that points behind the
  // movie box.
  static bool ShiftOffsets(std::string* moov, const Box& table, const Box& movie, std::int64_t delta) {
    const bool wide = table.Is("co64");
    const std::size_t start = static_cast<std::size_t>(table.offset - movie.offset + table.header);
    if (start + 8 > moov->size()) return false;
    auto* bytes = reinterpret_cast<unsigned char*>(moov->data());
    const std::uint64_t count = BE32(bytes + start + 4);
    const std::size_t width = wide ? 8 : 4;
    if (start + 8 + count * width > static_cast<std::size_t>(table.End() - movie.offset)) return false;
    for (std::uint64_t i = 0; i < count; ++i) {
      const std::size_t at = start + 8 + static_cast<std::size_t>(i) * width;
      const std::uint64_t offset = wide ? BE64(bytes + at) : BE32(bytes + at);
      if (offset < movie.End()) continue;
      const std::uint64_t moved = offset + static_cast<std::uint64_t>(delta);
      if (!wide && moved > 0xFFFFFFFFu) return false;
      const std::string text = wide ? PutBE32(static_cast<std::uint32_t>(moved >> 32)) + PutBE32(static_cast<std::uint32_t>(moved))
                                    : PutBE32(static_cast<std::uint32_t>(moved));
      moov->replace(at, width, text);
      bytes = reinterpret_cast<unsigned char*>(moov->data());
    }
    return true;
  }

  std::vector<Box> mBoxes;
  std::set<std::size_t> mUuidXMP;  // uuid boxes that carry XMP
  std::optional<int> mMovie, mUserData, mXMPBox;
  bool mQuickTime = false;
  bool mTruncated = false;
  bool mOffsetsElsewhere = false;
};

}  // namespace

std::unique_ptr<Container> MakeISOMediaContainer() { return std::make_unique<ISOMediaContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
