// Not part of the interface: the containers media files keep their XMP in.
// Each container walks its file once, bounded (a hostile file must neither
// exhaust the process nor reach the toolkit's handlers), finds the stored
// packet and plans the bytes of a new file that carries another packet and
// every other byte of the original.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace ovracore {
namespace filesupport {
class FileReplacement;
}
}  // namespace ovracore

namespace ovraxmp {
namespace detail {

// Real files nest fewer than ten levels and hold far fewer parts.
constexpr int kMaxContainerDepth = 32;
constexpr std::uint64_t kMaxParts = 1000000;

// A read the system failed (not the end of the file): whatever was being
// done with the file must stop.
class IOError : public std::runtime_error {
 public:
  IOError(const std::string& what, int error) : std::runtime_error(what), mError(error) {}
  int Error() const { return mError; }

 private:
  int mError;
};

// Reads of one open file. The first 64 KB are read at once: walks ask for a
// few bytes at a time and most files keep their metadata near the start.
class FileReader {
 public:
  FileReader(int fd, std::uint64_t size);
  std::uint64_t Size() const { return mSize; }
  // Exactly length bytes at offset; false when the file ends before.
  // Throws IOError when the system fails the read.
  bool Read(std::uint64_t offset, void* out, std::size_t length) const;
  // The same, as text; a file that ends before counts as a failed read.
  std::string ReadText(std::uint64_t offset, std::uint64_t length) const;

 private:
  int mFd;
  std::uint64_t mSize;
  std::vector<char> mHead;
};

std::uint16_t BE16(const unsigned char* p);
std::uint32_t BE32(const unsigned char* p);
std::uint64_t BE64(const unsigned char* p);
std::uint16_t LE16(const unsigned char* p);
std::uint32_t LE32(const unsigned char* p);
std::uint64_t LE64(const unsigned char* p);
std::string PutBE32(std::uint32_t value);
std::string PutLE32(std::uint32_t value);

// The bytes of a new file, in order: ranges of the original and new bytes.
class WritePlan {
 public:
  void Copy(std::uint64_t from, std::uint64_t to);
  void Insert(std::string bytes);
  std::uint64_t Size() const { return mSize; }
  bool Execute(ovracore::filesupport::FileReplacement& replacement, std::string* problem) const;

 private:
  struct Piece {
    std::uint64_t from = 0, to = 0;  // original bytes, when text is empty
    std::string text;
  };
  std::vector<Piece> mPieces;
  std::uint64_t mSize = 0;
};

// The original's bytes [0, size), with each patch (offset, bytes) written
// over the same number of bytes.
void CopyWithPatches(WritePlan* plan, std::uint64_t size,
                     std::vector<std::pair<std::uint64_t, std::string>> patches);

// How a packet names its extension: the MD5 digest of the extension's text
// as 32 upper-case hexadecimal digits.
std::string ExtensionDigest(const std::string& extension);

struct Extent {
  std::uint64_t offset = 0;
  std::uint64_t length = 0;
  std::uint64_t End() const { return offset + length; }
};

class Container {
 public:
  virtual ~Container() = default;
  // The name used in messages ("JPEG").
  virtual const char* Name() const = 0;
  // Walks the file; false, with the reason, when it must not be handed to
  // the toolkit nor written: broken sizes, nesting beyond the bounds, XMP
  // that exists but is empty. Throws IOError when a read fails.
  virtual bool Walk(const FileReader& file, std::string* problem) = 0;
  // Where the stored packet lies; empty when the file has none.
  const std::optional<Extent>& Packet() const { return mPacket; }
  // The text of the stored packet. Throws IOError when a read fails.
  virtual std::string PacketText(const FileReader& file) const;
  // Where the format continues a packet too large for one place (JPEG's
  // Extended XMP): the continuation's text, none when the file has none;
  // and the largest packet one place holds.
  virtual std::optional<std::string> ExtensionText(const FileReader&) const { return std::nullopt; }
  virtual std::optional<std::size_t> PacketLimit() const { return std::nullopt; }
  // The continuation the next PlanWrite writes: none leaves the file's as
  // it is, an empty one removes it.
  void SetExtension(std::optional<std::string> text) { mNewExtension = std::move(text); }
  // Whether the file holds metadata of its own (EXIF, IPTC, movie headers,
  // RIFF INFO, ID3) that the toolkit's handler shows beside the packet.
  bool HasNativeMetadata() const { return mNative; }
  // Whether Walk followed the whole structure; a container that only found
  // packets by their markers answers false and writes packets in place only.
  virtual bool KnowsLayout() const { return true; }
  // Plans the new file with packet as its XMP, every other byte kept.
  // The default writes a packet of the stored packet's length in its place
  // and refuses anything else. False, with the reason, when it cannot.
  virtual bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                         std::string* problem) const;

 protected:
  bool Refuse(std::string* problem, const std::string& why) const;
  bool SameLengthInPlace(const FileReader& file, const std::string& packet, WritePlan* plan) const;
  // Records the packet at extent after checking that it is not blank.
  bool TakePacket(const FileReader& file, Extent extent, std::string* problem);

  std::optional<Extent> mPacket;
  bool mNative = false;
  std::optional<std::string> mNewExtension;
};

// The container the file's first bytes announce; for anything else one that
// finds packets by their markers.
std::unique_ptr<Container> ContainerFor(const FileReader& file);

// The keyword of the PNG text chunk that carries XMP.
const std::string& PNGPacketKeyword();

std::unique_ptr<Container> MakeJPEGContainer();
std::unique_ptr<Container> MakePNGContainer();
std::unique_ptr<Container> MakeTIFFContainer();
std::unique_ptr<Container> MakePSDContainer();
std::unique_ptr<Container> MakeISOMediaContainer();
std::unique_ptr<Container> MakeRIFFContainer();
std::unique_ptr<Container> MakeMP3Container();
std::unique_ptr<Container> MakeGIFContainer();
std::unique_ptr<Container> MakeScannedContainer();

}  // namespace detail
}  // namespace ovraxmp
