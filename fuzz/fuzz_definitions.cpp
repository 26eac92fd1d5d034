// Definitions files: the parser must report bad input, never crash or hang.
#include <cstddef>
#include <cstdint>
#include <string>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>

#include "FuzzSupport.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  ovrafuzz::StartLibrary();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const ovrametadata::UTF8String buffer(reinterpret_cast<const char*>(data), size);
  const ovrametadata::DefinitionsPair parsed = ovrametadata::ParseBufferForDefinitions(buffer, u"fuzz.xml");
  (void)parsed;
  return 0;
}
