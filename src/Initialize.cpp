// Start-up and shutdown: the toolkit, the built-in and custom definitions.
#include <ovracore/Diagnostics.h>
#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPFiles.h>
#include <ovraxmp/XMPMeta.h>

#include "DefinitionsRegistryInternal.h"
#include "InitializeInternal.h"
#include "extensions/ExtensionsInternal.h"
#include "format/FormatInternal.h"
#include "views/ViewsInternal.h"

namespace ovrametadata {

namespace {

const char* const kXMLResourceType = "xml";
const char* const kStartupTimeCategory = "StartupTime";
// The maker's schemas that ship as custom files but are never user-supplied.
const char* const kDICOMNamespace = "http://ns.ovrametadata.org/DICOM/";
const char* const kSWFNamespace = "http://ns.ovrametadata.org/swf/1.0/";

// Client calls are counted; only the first Initialize and the last
// Terminate do work. Not locked: the client pairs them on one thread.
unsigned sInitializationCount = 0;
// The library's own resources, where the built-in definitions live.
const ovracore::ResourceTable* sModule = nullptr;

const char* const kBaseResources[] = {"primitive_type_definitions",
                                      "constructed_type_definitions", "aux_definitions",
                                      "orlex_definitions"};
// Schemas real photo files carry beyond the standard set; they use the
// standard schemas' types, so they load after them.
const char* const kCommonResources[] = {"lr_definitions", "mwgrs_definitions", "mwgkw_definitions",
                                        "gpano_definitions"};

// The toolkit's internal assertions are of no interest to the host.
void IgnoreToolkitAssertion(void*, const char*) {}

void StartToolkit() {
  if (!ovraxmp::XMPMeta::Initialize()) {
    throw ovraxmp::XMP_Error(ovraxmp::kXMPErr_Unavailable, "the XMP toolkit did not start");
  }
  ovraxmp::XMPMeta::RegisterAssertNotify(&IgnoreToolkitAssertion, nullptr);
  try {
    if (!ovraxmp::XMPFiles::Initialize(ovracore::ToUTF8(XMPFilesPluginsDirectory()))) {
      throw ovraxmp::XMP_Error(ovraxmp::kXMPErr_Unavailable,
                               "the XMP file handlers did not start");
    }
  } catch (...) {
    ovraxmp::XMPMeta::RegisterAssertNotify(nullptr, nullptr);
    ovraxmp::XMPMeta::Terminate();
    throw;
  }
}

void LoadCommonSchemas() {
  for (const char* name : kCommonResources) {
    for (const SchemaDefinitionPtr& schema : LoadDefinitionsFromResource(ovracore::ToUTF16(name)).first) {
      schema->isCustom = false;
      AddCommonSchemaDefinition(schema);
    }
  }
}

void LoadStandardSchemas() {
  for (int index = 0; index < kStandardSchemaCount; ++index) {
    const auto standard = static_cast<StandardSchema>(index);
    const DefinitionsPair loaded =
        LoadDefinitionsFromResource(ovracore::ToUTF16(StandardSchemaStem(standard) + "_definitions"));
    // A resource with no schema or several is registered but not recorded.
    if (loaded.first.size() != 1 || HasStandardSchemaNamespace(standard)) continue;
    const SchemaDefinitionPtr& schema = loaded.first.front();
    schema->isCustom = false;
    SetStandardSchemaNamespace(standard, schema->namespaceURI);
    if (schema->isDynamic) {
      AddDynamicSchemaDefinition(schema);
    } else {
      AddCommonSchemaDefinition(schema);
    }
  }
}

// Asks the toolkit once; a toolkit that cannot say answers empty.
UTF8String AskVersionInfo() {
  try {
    return ovraxmp::XMPMeta::GetVersionInfo();
  } catch (ovraxmp::XMP_Error const&) {
    return {};
  }
}

}  // namespace

bool IsLibraryInitialized() { return sInitializationCount != 0; }

const ovracore::ResourceTable* LibraryResources() { return IsLibraryInitialized() ? sModule : nullptr; }

void Initialize() {
  if (sInitializationCount++ != 0) return;
  ovracore::LogTimeMark(kStartupTimeCategory, "Start Initializing ovrametadata");
  try {
    StartToolkit();
  } catch (...) {
    // A start that failed is not counted: the next Initialize tries again.
    --sInitializationCount;
    throw;
  }
  ovraxmp::XMPMeta::SetClientName(ovracore::SuiteClientName());
  sModule = &ovrametadataResources();

  // The base resources define the types everything else refers to; their
  // schemas are registered but listed nowhere.
  for (const char* name : kBaseResources) LoadDefinitionsFromResource(ovracore::ToUTF16(name));
  LoadStandardSchemas();
  LoadCommonSchemas();
  LoadDefinitionsDirectory(CustomDefinitionsGlobalDirectory(), &IsSchemaExcludedFromGlobal);
  LoadDefinitionsDirectory(CustomDefinitionsUserDirectory(), {});

  // Their paths are built from the definitions, so they come last.
  RegisterBuiltInFormatters();

  ovracore::LogTimeMark(kStartupTimeCategory, "Finish Initializing ovrametadata");
}

void Terminate() {
  if (--sInitializationCount != 0) {
    DeleteEmptyXMPWritingCallbacks();
    DeleteEmptyErrorCallbacks();
    return;
  }
  ClearXMPWritingCallbacks();
  ClearErrorCallbacks();
  ClearExtensionPackages();
  ClearErrorList();
  ClearFormatterTables();
  // Views point into the definitions, so they go first.
  ClearViewDefinitions();
  ClearDefinitionsRegistry();

  ovraxmp::XMPFiles::Terminate();
  ovraxmp::XMPMeta::RegisterAssertNotify(nullptr, nullptr);
  ovraxmp::XMPMeta::Terminate();
}

UTF8String GetXMPCoreVersion() {
  static const UTF8String version = AskVersionInfo();
  return version;
}

UTF8String GetXMPFilesVersion() {
  // The toolkit builds its core and its file handlers as one library, so
  // both parts report the same version.
  static const UTF8String version = AskVersionInfo();
  return version;
}

// --- Loaders

DefinitionsPair LoadDefinitionsFromResource(UTF16String const& name) {
  if (!sModule) return {};
  const auto contents = sModule->Read(ovracore::ToUTF8(name), kXMLResourceType);
  if (!contents || contents->empty()) return {};
  return ParseBufferAndRegisterDefinitions(UTF8String(*contents), name, false);
}

void LoadDefinitionsDirectory(UTF16String const& folder,
                              boost::function<bool(UTF16String const&)> const& exclude) {
  if (folder.empty()) return;
  const ovracore::filesupport::Dir directory(folder);
  if (!directory.Exists()) return;
  const ovracore::filesupport::Dir dictionaries = directory.SubDir(u"loc");
  const bool hasDictionaries = dictionaries.Exists();
  for (const auto& file : directory.Files()) {
    if (file.Extension() != u".xml") continue;
    if (exclude && exclude(file.Name())) continue;
    if (hasDictionaries) {
      // The file's labels must find their translations while it is parsed.
      const auto dictionary = dictionaries.FileNamed(
          file.Title() + u"_" + ovracore::ToUTF16(ovracore::ApplicationLanguage()) + u".dat");
      if (dictionary.Exists()) ovracore::AddDictionaryFile(dictionary.FullPath());
    }
    LoadDefinitionsFromFile(file, true);
  }
}

void LoadDefinitionsFromFile(ovracore::filesupport::File const& file, bool isCustomFolder) {
  const UTF16String path = file.FullPath();
  // Custom files never merge into registered schemas; extension packages may.
  const DefinitionsPair loaded = ParseDocumentAndRegisterDefinitions(path, !isCustomFolder);
  for (const auto& schema : loaded.first) {
    if (schema->isDynamic) {
      schema->isCustom = false;
      AddDynamicSchemaDefinition(schema);
    } else {
      AddCommonSchemaDefinition(schema);
    }
    SetFilePathForSchema(path, schema);
    if (schema->namespaceURI == kDICOMNamespace || schema->namespaceURI == kSWFNamespace ||
        !isCustomFolder) {
      schema->isCustom = false;
    }
  }
  for (const auto& type : loaded.second) SetFilePathForType(path, type);
}

}  // namespace ovrametadata
