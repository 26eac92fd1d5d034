// The folders below the application-support roots that the library reads.
#include <exception>

#include <ovracore/FileSupport.h>

#include <ovrametadata/Extensions.h>

#include "InitializeInternal.h"

namespace ovrametadata {

const UTF16String kCustomExtensionPath = u"Orlex/XMP/Metadata Extensions";

namespace {

using ovracore::filesupport::Dir;

const UTF16String kCustomSchemaPath = u"Orlex/XMP/Custom Propsheet Panels/4.0/custom";
const UTF16String kPanelsPathVersion4 = u"Orlex/XMP/Custom Propsheet Panels/4.0/panels";
const UTF16String kPanelsPathVersion3 = u"Orlex/XMP/Custom Propsheet Panels/3.0/panels";
const UTF16String kPanelsPathVersion2 = u"Orlex/XMP/Custom Propsheet Panels/2.0/panels";
const UTF16String kXMPFiles = u"XMPFiles";

// Without a usable root the answer is an empty path, which the loaders
// treat as a missing folder.
UTF16String BelowRoot(Dir (*root)(), UTF16String const& relative) {
  try {
    return root().SubDir(relative).FullPath();
  } catch (std::exception const&) {
    return {};
  }
}

UTF16String const& PanelsPath(VelkVersion version) {
  switch (version) {
    case kPanelsVersion4: return kPanelsPathVersion4;
    case kPanelsVersion3: return kPanelsPathVersion3;
    default: return kPanelsPathVersion2;
  }
}

}  // namespace

UTF16String CustomDefinitionsGlobalDirectory() {
  return BelowRoot(&ovracore::filesupport::ApplicationSupportFolder_Local, kCustomSchemaPath);
}

UTF16String CustomDefinitionsUserDirectory() {
  return BelowRoot(&ovracore::filesupport::ApplicationSupportFolder_User, kCustomSchemaPath);
}

UTF16String CustomExtensionsGlobalDirectory() {
  return BelowRoot(&ovracore::filesupport::ApplicationSupportFolder_Local, kCustomExtensionPath);
}

UTF16String CustomExtensionsUserDirectory() {
  return BelowRoot(&ovracore::filesupport::ApplicationSupportFolder_User, kCustomExtensionPath);
}

UTF16String PanelsDefinitionsUserDirectory(VelkVersion version) {
  return BelowRoot(&ovracore::filesupport::ApplicationSupportFolder_User, PanelsPath(version));
}

UTF16String PanelsDefinitionsGlobalDirectory(VelkVersion version) {
  return BelowRoot(&ovracore::filesupport::ApplicationSupportFolder_Local, PanelsPath(version));
}

UTF16String XMPFilesPluginsDirectory() {
  return ovracore::filesupport::PluginsFolder().SubDir(kXMPFiles).FullPath();
}

bool IsSchemaExcludedFromGlobal(UTF16String const& fileName) {
  return fileName == u"DICOM.xml" || fileName == u"Mobile.xml";
}

bool StoreText(UTF16String const& path, UTF8String const& text, bool* written) {
  namespace fs = ovracore::filesupport;
  if (!fs::FileUtils::EnsureDirectoryExists(Dir(fs::File(path).FSPath().parent_path()))) return false;
  const bool saved = fs::SafeSave(path, text);
  if (written) *written = saved;
  return true;
}

}  // namespace ovrametadata
