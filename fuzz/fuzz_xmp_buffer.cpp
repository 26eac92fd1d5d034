// XMP packets in memory: through the toolkit layer (parse, walk, serialise)
// and through a buffer provider with a write-back.
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include <boost/make_shared.hpp>

#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/Values.h>

#include "FuzzSupport.h"

namespace {

class Buffer : public ovrametadata::BufferProviderImpl {
 public:
  Buffer(const std::uint8_t* data, std::size_t size) : BufferProviderImpl(data, size) {}
  void WriteBuffer(const std::vector<ovrametadata::Path>&, const char* data, std::size_t length) override {
    written.assign(data, length);
  }
  std::string written;
};

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  ovrafuzz::StartLibrary();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  try {
    ovraxmp::XMPMeta meta;
    meta.ParseFromBuffer(reinterpret_cast<const char*>(data), size);
    ovraxmp::XMPIterator it(meta, ovraxmp::kXMP_IterProperties);
    std::string ns, path, value;
    ovraxmp::XMP_OptionBits options = 0;
    for (int i = 0; i < 1000 && it.Next(&ns, &path, &value, &options); ++i) {
    }
    std::string out;
    out = meta.SerializeToBuffer();
  } catch (const ovraxmp::XMP_Error&) {
    // Refusing bad input is the expected outcome.
  }

  auto provider = boost::make_shared<Buffer>(data, size);
  static const ovrametadata::Path title =
      ovrametadata::PathForSchemaNameAndPropertyName(ovrametadata::UTF8String("http://purl.org/dc/elements/1.1/"),
                                                     "title");
  static const ovrametadata::Path subject =
      ovrametadata::PathForSchemaNameAndPropertyName(ovrametadata::UTF8String("http://purl.org/dc/elements/1.1/"),
                                                     "subject");
  {
    ovrametadata::MetaDataUpdateAccess access(provider);
    ovrametadata::UTF8String text;
    ovrametadata::GetValue(*access, title, text);
    ovrametadata::GetValue(*access, subject, text);
    if (*access && ovrametadata::SetValue(*access, title, "fuzzed")) access.AddChange(title);
  }
  return 0;
}
