// Extension packages: manifests, finding and de-duplicating packages, and
// loading what the registered ones hold.
#include <algorithm>
#include <charconv>
#include <memory>
#include <sstream>
#include <string_view>

#include <ovracore/FileSupport.h>
#include <ovracore/Localizer.h>
#include <ovracore/SAXParser.h>
#include <ovracore/Strings.h>
#include <ovrametadata/Extensions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Views.h>

#include "InitializeInternal.h"
#include "extensions/ExtensionsInternal.h"

namespace ovrametadata {

using namespace std::string_view_literals;
using ovracore::filesupport::Dir;
using ovracore::filesupport::File;

namespace {

const char* const kExtensionNamespace = "http://ns.ovrametadata.org/metadata/extension/1.0/";
const char16_t* const kManifestName = u"manifest.xml";

// Filled at start-up by the first LoadAllViewDefinitions.
std::vector<ExtensionPackage> sPackages;

// Collects the attributes of the manifest's extension element; a later
// element's values replace earlier ones.
class ManifestHandler : public ovracore::AbstractParseHandler {
 public:
  explicit ManifestHandler(ExtensionManifestParser::ManifestInfo& info) : mInfo(info) {}
  void StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                    const ovracore::Attributes& attributes) override {
    if (namespaceURI != kExtensionNamespace || localName != "extension"sv) return;
    for (const auto& attribute : attributes.All()) {
      if (!attribute.namespaceURI.empty() || attribute.value.empty()) continue;
      UTF16String* field = attribute.localName == "name"sv            ? &mInfo.name
                           : attribute.localName == "version"sv       ? &mInfo.version
                           : attribute.localName == "locFilePrefix"sv ? &mInfo.locFilePrefix
                                                                      : nullptr;
      if (field) *field = ovracore::ToUTF16(attribute.value);
    }
  }

 private:
  ExtensionManifestParser::ManifestInfo& mInfo;
};

// A version that does not read as a number is 0, so that any numbered
// package of the same name replaces it.
float ReadVersion(const UTF16String& text) {
  const UTF8String utf8(ovracore::TrimBlanks(ovracore::ToUTF8(text)));
  float value = 0;
  const auto [end, ec] = std::from_chars(utf8.data(), utf8.data() + utf8.size(), value);
  return ec == std::errc() ? value : 0;
}

UTF8String VersionText(float version) {
  std::ostringstream out;
  out << version;
  return out.str();
}

void ReportContent(std::string_view message, const UTF16String& context) {
  SendError(kExtensionManifestParsingError, ovracore::ZString(message), context);
}

// Ties a package into the list by name: the higher version stays; of equal
// versions the one registered first.
void Register(ExtensionPackage package) {
  const auto registered = std::find_if(sPackages.begin(), sPackages.end(),
                                       [&](const ExtensionPackage& p) { return p.name == package.name; });
  if (registered == sPackages.end()) {
    sPackages.push_back(std::move(package));
    return;
  }
  const UTF8String name = ovracore::ToUTF8(package.name);
  if (registered->version == package.version) {
    SendError(kExtensionPackageRegistrationError,
              ovracore::ZString("$$$/ovrametadata/ExtensionPackages/DuplicateExtensionPackage/SameVersions="
                                "extension package with name #{quot}@0#{quot} already exists.",
                                {name}),
              registered->path);
    return;
  }
  const bool replace = registered->version < package.version;
  const ExtensionPackage& dropped = replace ? *registered : package;
  SendError(kExtensionPackageRegistrationError,
            ovracore::ZString("$$$/ovrametadata/ExtensionPackages/DuplicateExtensionPackage/DifferentVersions="
                              "extension package with name #{quot}@0#{quot} already exists. Package with lower "
                              "version number #{quot}@1#{quot} will be ignored.",
                              {name, VersionText(dropped.version)}),
            dropped.path);
  if (!replace) return;
  sPackages.erase(registered);
  sPackages.push_back(std::move(package));
}

void LoadPackage(const ExtensionPackage& package) {
  const Dir folder(package.path);
  const Dir loc = folder.SubDir(u"loc");
  if (loc.Exists()) {
    UTF16String name = package.locFilePrefix.empty() ? UTF16String() : package.locFilePrefix + u"_";
    name += ovracore::ToUTF16(ovracore::ApplicationLanguage()) + u".dict";
    const File dictionary = loc.FileNamed(name);
    if (dictionary.Exists()) ovracore::AddDictionaryFile(dictionary.FullPath());
  } else if (!package.locFilePrefix.empty()) {
    ReportContent("$$$/ovrametadata/ErrorInManifestParser/MissingLocDir=localization directory is missing from "
                  "extension package.",
                  loc.FullPath());
  }
  bool found = false;
  // Exactly ".xml": files named otherwise are not the package's content.
  const auto xmlFiles = [&](const UTF16String& sub) {
    std::vector<File> files;
    const Dir dir = folder.SubDir(sub);
    if (!dir.Exists()) return files;
    for (const File& file : dir.Files())
      if (file.Extension() == u".xml") files.push_back(file);
    found = found || !files.empty();
    return files;
  };
  for (const File& file : xmlFiles(u"schema")) LoadDefinitionsFromFile(file, false);
  for (const File& file : xmlFiles(u"view")) {
    const UTF16String path = file.FullPath();
    for (const ViewDefinitionPtr& view : ParseViewDefinitionsFromDocument(path)) AddViewDefinition(view, path);
  }
  if (!found) {
    ReportContent("$$$/ovrametadata/ErrorInManifestParser/MissingSchemaAndView=neither schema nor view file is "
                  "present in extension package.",
                  package.path);
  }
}

}  // namespace

bool ParseExtensionManifestFromDocument(const UTF16String& path, ExtensionManifestParser::ManifestInfo& info) {
  ExtensionManifestParser::ManifestInfo read;
  ManifestHandler handler(read);
  const std::unique_ptr<ovracore::Parser> parser = ovracore::GetParserWithNamespaceSupport(handler);
  const bool parsed = parser->ParseFile(path);
  info = read;
  if (!parsed) ReportContent("$$$/ovrametadata/ExtensionManifestParser/InvalidXML=invalid XML.", path);
  return parsed;
}

bool WriteExtensionManifest(const GenericPanelManifestParser::ManifestInfo& info, const UTF16String& path) {
  const auto attribute = [](const char* name, const UTF16String& value) {
    return UTF8String(" ") + name + "=\"" + ovracore::EncodeXMLReserved(ovracore::ToUTF8(value)) + "\"";
  };
  const UTF8String text = UTF8String("<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n<extension") +
                          attribute("xmlns", ovracore::ToUTF16(kExtensionNamespace)) +
                          attribute("name", info.name) + attribute("version", info.version) +
                          attribute("locFilePrefix", info.localizationFile) + " />\n";
  bool written = false;
  return StoreText(path, text, &written) && written;
}

void RegisterExtensionPackages(const UTF16String& folder) {
  if (folder.empty()) return;
  const Dir root(folder);
  if (!root.Exists()) return;
  std::vector<std::pair<UTF16String, bool>> entries;  // name, is a folder
  for (const Dir& dir : root.SubDirs()) entries.emplace_back(dir.Name(), true);
  // A file where a package belongs is a package without a manifest.
  for (const File& file : root.Files()) entries.emplace_back(file.Name(), false);
  std::sort(entries.begin(), entries.end());
  for (const auto& [name, isFolder] : entries) {
    if (name.empty() || name.front() == u'.') continue;
    const Dir packageFolder = root.SubDir(name);
    const File manifest = packageFolder.FileNamed(kManifestName);
    if (!isFolder || !manifest.Exists()) {
      ReportContent("$$$/ovrametadata/ErrorInManifestParser/MissingManifest=manifest file is missing from "
                    "extension package.",
                    manifest.FullPath());
      continue;
    }
    ExtensionManifestParser::ManifestInfo info;
    if (!ParseExtensionManifestFromDocument(manifest.FullPath(), info)) continue;
    Register({packageFolder.FullPath(), info.name, ReadVersion(info.version), info.locFilePrefix});
  }
}

std::vector<ExtensionPackage> RegisteredExtensionPackages() { return sPackages; }

void LoadExtensionPackages() {
  RegisterExtensionPackages(CustomExtensionsGlobalDirectory());
  RegisterExtensionPackages(CustomExtensionsUserDirectory());
  for (const ExtensionPackage& package : sPackages) LoadPackage(package);
}

void ClearExtensionPackages() { sPackages.clear(); }

}  // namespace ovrametadata
