// ovraxmp: access to the XMP embedded in media files and in .xmp sidecars.
#pragma once

#include <string>

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>

namespace ovraxmp {

class XMPFiles {
 public:
  // Counted start of the file part (it also holds a start of the core). The
  // plug-in folder is recorded; no plug-ins are loaded. Throws XMP_Error on
  // failure.
  static bool Initialize(const std::string& pluginFolder);
  static void Terminate();
  // The folder given to the first Initialize, empty when none.
  static std::string GetPluginFolder();
};

}  // namespace ovraxmp
