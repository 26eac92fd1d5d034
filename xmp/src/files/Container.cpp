// Reading files for the container walks, planning new files, and choosing
// the container by the first bytes.
#include "Container.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include <boost/uuid/detail/md5.hpp>

#include <ovracore/SafeWrite.h>

#include "PacketScan.h"

namespace ovraxmp {
namespace detail {

namespace {
constexpr std::uint64_t kHeadSize = 64 * 1024;
}

FileReader::FileReader(int fd, std::uint64_t size) : mFd(fd), mSize(size) {
  std::vector<char> head(static_cast<std::size_t>(std::min(size, kHeadSize)));
  if (Read(0, head.data(), head.size())) mHead = std::move(head);
}

bool FileReader::Read(std::uint64_t offset, void* out, std::size_t length) const {
  if (offset > mSize || length > mSize - offset) return false;
  if (offset + length <= mHead.size()) {
    if (length > 0) std::memcpy(out, mHead.data() + offset, length);
    return true;
  }
  auto* p = static_cast<char*>(out);
  while (length > 0) {
    const ssize_t got = ::pread(mFd, p, length, static_cast<off_t>(offset));
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) throw IOError("cannot read the file", errno);
    if (got == 0) return false;  // cut short since it was measured
    p += got;
    offset += static_cast<std::uint64_t>(got);
    length -= static_cast<std::size_t>(got);
  }
  return true;
}

std::string FileReader::ReadText(std::uint64_t offset, std::uint64_t length) const {
  if (length > kMaxPacketBytes) throw IOError("the packet is too large", EFBIG);
  std::string text(static_cast<std::size_t>(length), '\0');
  if (!Read(offset, text.data(), text.size())) throw IOError("the file was cut short while it was read", 0);
  return text;
}

std::uint16_t BE16(const unsigned char* p) { return static_cast<std::uint16_t>((p[0] << 8) | p[1]); }
std::uint32_t BE32(const unsigned char* p) {
  return (std::uint32_t(p[0]) << 24) | (std::uint32_t(p[1]) << 16) | (std::uint32_t(p[2]) << 8) | p[3];
}
std::uint64_t BE64(const unsigned char* p) { return (std::uint64_t(BE32(p)) << 32) | BE32(p + 4); }
std::uint16_t LE16(const unsigned char* p) { return static_cast<std::uint16_t>((p[1] << 8) | p[0]); }
std::uint32_t LE32(const unsigned char* p) {
  return (std::uint32_t(p[3]) << 24) | (std::uint32_t(p[2]) << 16) | (std::uint32_t(p[1]) << 8) | p[0];
}
std::uint64_t LE64(const unsigned char* p) { return (std::uint64_t(LE32(p + 4)) << 32) | LE32(p); }
std::string PutBE32(std::uint32_t v) {
  return {char(v >> 24), char((v >> 16) & 0xFF), char((v >> 8) & 0xFF), char(v & 0xFF)};
}
std::string PutLE32(std::uint32_t v) {
  return {char(v & 0xFF), char((v >> 8) & 0xFF), char((v >> 16) & 0xFF), char(v >> 24)};
}

std::string ExtensionDigest(const std::string& extension) {
  boost::uuids::detail::md5 hash;
  hash.process_bytes(extension.data(), extension.size());
  boost::uuids::detail::md5::digest_type digest;
  hash.get_digest(digest);
  char hex[33];
  for (int i = 0; i < 4; ++i) std::snprintf(hex + 8 * i, 9, "%08X", static_cast<unsigned>(digest[i]));
  return std::string(hex, 32);
}

// ---------------------------------------------------------------- WritePlan

void WritePlan::Copy(std::uint64_t from, std::uint64_t to) {
  if (to <= from) return;
  if (!mPieces.empty() && mPieces.back().text.empty() && mPieces.back().to == from) {
    mPieces.back().to = to;
  } else {
    mPieces.push_back({from, to, std::string()});
  }
  mSize += to - from;
}

void WritePlan::Insert(std::string bytes) {
  if (bytes.empty()) return;
  mSize += bytes.size();
  mPieces.push_back({0, 0, std::move(bytes)});
}

bool WritePlan::Execute(ovracore::filesupport::FileReplacement& replacement, std::string* problem) const {
  for (const Piece& piece : mPieces) {
    const bool ok = piece.text.empty() ? replacement.AppendOriginal(piece.from, piece.to, problem)
                                       : replacement.Append(piece.text, problem);
    if (!ok) return false;
  }
  return true;
}

void CopyWithPatches(WritePlan* plan, std::uint64_t size,
                     std::vector<std::pair<std::uint64_t, std::string>> patches) {
  std::sort(patches.begin(), patches.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
  std::uint64_t at = 0;
  for (auto& patch : patches) {
    plan->Copy(at, patch.first);
    at = patch.first + patch.second.size();
    plan->Insert(std::move(patch.second));
  }
  plan->Copy(at, size);
}

// ---------------------------------------------------------------- Container

bool Container::Refuse(std::string* problem, const std::string& why) const {
  if (problem) *problem = std::string(Name()) + ": " + why;
  return false;
}

std::string Container::PacketText(const FileReader& file) const {
  return mPacket ? file.ReadText(mPacket->offset, mPacket->length) : std::string();
}

bool Container::TakePacket(const FileReader& file, Extent extent, std::string* problem) {
  if (mPacket) return true;  // the first one is the one readers take
  if (extent.length > kMaxPacketBytes)
    return Refuse(problem, "XMP packet larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB");
  const std::string text = file.ReadText(extent.offset, extent.length);
  if (text.find_first_not_of(std::string(" \t\r\n\0", 5)) == std::string::npos)
    return Refuse(problem, "the XMP packet is empty");
  mPacket = extent;
  return true;
}

bool Container::SameLengthInPlace(const FileReader& file, const std::string& packet, WritePlan* plan) const {
  if (!mPacket || packet.size() != mPacket->length) return false;
  plan->Copy(0, mPacket->offset);
  plan->Insert(packet);
  plan->Copy(mPacket->End(), file.Size());
  return true;
}

bool Container::PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                          std::string* problem) const {
  if (SameLengthInPlace(file, packet, plan)) return true;
  return Refuse(problem, mPacket ? "the XMP packet has no room for the new metadata"
                                 : "files of this kind are written only where they already hold an XMP packet");
}

std::unique_ptr<Container> ContainerFor(const FileReader& file) {
  unsigned char head[12] = {};
  const bool have = file.Read(0, head, std::min<std::uint64_t>(sizeof head, file.Size()));
  const std::size_t n = have ? static_cast<std::size_t>(std::min<std::uint64_t>(sizeof head, file.Size())) : 0;
  const auto starts = [&](const char* magic, std::size_t length, std::size_t at = 0) {
    return n >= at + length && std::memcmp(head + at, magic, length) == 0;
  };
  if (starts("\xFF\xD8\xFF", 3)) return MakeJPEGContainer();
  if (starts("\x89PNG\r\n\x1A\n", 8)) return MakePNGContainer();
  if (starts("II*\0", 4) || starts("MM\0*", 4) || starts("II+\0", 4) || starts("MM\0+", 4)) return MakeTIFFContainer();
  if (starts("8BPS", 4)) return MakePSDContainer();
  if (starts("RIFF", 4) || starts("RF64", 4)) return MakeRIFFContainer();
  if (starts("ID3", 3)) return MakeMP3Container();
  if (starts("GIF87a", 6) || starts("GIF89a", 6)) return MakeGIFContainer();
  static const char* const kFirstBoxes[] = {"ftyp", "moov", "mdat", "free", "skip", "wide", "pnot", "uuid"};
  for (const char* box : kFirstBoxes)
    if (starts(box, 4, 4)) return MakeISOMediaContainer();
  return MakeScannedContainer();
}

}  // namespace detail
}  // namespace ovraxmp
