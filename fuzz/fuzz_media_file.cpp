// Media files through FileProvider: load, read, write back, detect the
// format. The first input byte chooses the file name extension; the rest
// is the file.
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <string>
#include <vector>

#include <boost/make_shared.hpp>

#include <ovracore/Strings.h>
#include <ovrametadata/MetadataUtils.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/Values.h>

#include "FuzzSupport.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  ovrafuzz::StartLibrary();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  static const char* const kExtensions[] = {".jpg", ".mp4", ".mov", ".wav", ".avi", ".png",
                                            ".tif", ".mp3", ".psd", ".gif", ".xmp", ".bin"};
  const std::string path = ovrafuzz::ScratchFolder() + "/input" + kExtensions[data[0] % 12];
  {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(data + 1), static_cast<std::streamsize>(size - 1));
  }
  const ovrametadata::UTF16String path16 = ovracore::ToUTF16(path);
  static const ovrametadata::Path title = ovrametadata::PathForSchemaNameAndPropertyName(
      ovrametadata::UTF8String("http://purl.org/dc/elements/1.1/"), "title");
  auto provider = boost::make_shared<ovrametadata::FileProvider>(path16);
  {
    ovrametadata::MetaDataUpdateAccess access(provider);
    ovrametadata::UTF8String text;
    ovrametadata::GetValue(*access, title, text);
    if (*access && ovrametadata::SetValue(*access, title, "fuzzed")) access.AddChange(title);
  }
  provider->ReloadFile();
  ovrametadata::utility::EraseCachedXMPFormat(path16);
  ovrametadata::utility::GetXMPFormat(path16);
  std::vector<ovrametadata::UTF16String> files;
  ovrametadata::utility::GetAssociatedFiles(path16, files);
  return 0;
}
