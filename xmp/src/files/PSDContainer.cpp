// Photoshop documents: the image resources section holds the XMP as
// resource 1060 beside IPTC, EXIF and the rest. The sections that follow
// are found by their lengths, not by offsets, so the section may grow.
#include <cstring>

#include "Container.h"

namespace ovraxmp {
namespace detail {
namespace {

constexpr std::uint16_t kXMPResource = 1060;

class PSDContainer : public Container {
 public:
  const char* Name() const override { return "PSD"; }

  bool Walk(const FileReader& file, std::string* problem) override {
    mNative = true;  // IPTC, EXIF, resolution and the rest of the resources
    unsigned char bytes[12];
    if (!file.Read(26, bytes, 4)) return Refuse(problem, "header cut short");
    const std::uint64_t colorModeEnd = 30 + std::uint64_t(BE32(bytes));
    if (!file.Read(colorModeEnd, bytes, 4)) return Refuse(problem, "resources section outside the file");
    mSection = colorModeEnd;
    mSectionEnd = colorModeEnd + 4 + BE32(bytes);
    if (mSectionEnd > file.Size()) return Refuse(problem, "resources section outside the file");
    std::uint64_t pos = colorModeEnd + 4;
    std::uint64_t resources = 0;
    while (pos + 12 <= mSectionEnd) {
      if (!file.Read(pos, bytes, 7)) return Refuse(problem, "resource cut short");
      if (++resources > kMaxParts) return Refuse(problem, "too many resources");
      const std::uint16_t id = BE16(bytes + 4);
      const std::uint64_t nameSize = (std::uint64_t(bytes[6]) + 2) & ~std::uint64_t(1);  // length byte, even
      const std::uint64_t sizeAt = pos + 6 + nameSize;
      if (sizeAt + 4 > mSectionEnd || !file.Read(sizeAt, bytes, 4)) return Refuse(problem, "resource cut short");
      const std::uint64_t size = BE32(bytes);
      const std::uint64_t data = sizeAt + 4;
      const std::uint64_t end = data + size + (size & 1);
      if (data + size > mSectionEnd) return Refuse(problem, "resource runs past its section");
      if (id == kXMPResource && !mPacket) {
        mResource = {pos, std::min(end, mSectionEnd) - pos};
        if (!TakePacket(file, {data, size}, problem)) return false;
      }
      pos = end;
    }
    return true;
  }

  bool PlanWrite(const FileReader& file, const std::string& packet, WritePlan* plan,
                 std::string* problem) const override {
    if (SameLengthInPlace(file, packet, plan)) return true;
    std::string resource = "8BIM";
    resource += static_cast<char>(kXMPResource >> 8);
    resource += static_cast<char>(kXMPResource & 0xFF);
    resource.append(2, '\0');  // empty name, padded to even
    resource += PutBE32(static_cast<std::uint32_t>(packet.size()));
    resource += packet;
    if (packet.size() & 1) resource += '\0';
    const std::uint64_t oldSize = mSectionEnd - mSection - 4;
    const std::uint64_t newSize = oldSize - (mPacket ? mResource.length : 0) + resource.size();
    if (newSize > 0xFFFFFFFFu) return Refuse(problem, "the resources section would outgrow 4 GB");
    const std::uint64_t at = mPacket ? mResource.offset : mSectionEnd;
    plan->Copy(0, mSection);
    plan->Insert(PutBE32(static_cast<std::uint32_t>(newSize)));
    plan->Copy(mSection + 4, at);
    plan->Insert(std::move(resource));
    plan->Copy(mPacket ? mResource.End() : mSectionEnd, file.Size());
    return true;
  }

 private:
  std::uint64_t mSection = 0, mSectionEnd = 0;  // its length field, and its end
  Extent mResource;
};

}  // namespace

std::unique_ptr<Container> MakePSDContainer() { return std::make_unique<PSDContainer>(); }

}  // namespace detail
}  // namespace ovraxmp
