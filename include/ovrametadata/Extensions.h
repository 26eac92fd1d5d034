// ovrametadata: extension packages, folders that add schemas, views and a
// dictionary to the library without changing it.
//
// A package is a folder below one of the two package folders:
//   manifest.xml   <extension xmlns="http://ns.ovrametadata.org/metadata/extension/1.0/"
//                             name="..." version="1.0" locFilePrefix="..."/>
//   schema/*.xml   definitions files
//   view/*.xml     view definitions files
//   loc/PREFIX_LANGUAGE.dict   the dictionary for the application's language
// Of two packages with one name the higher version is loaded; with equal
// versions the one found first (the machine's before the user's).
#pragma once

#include <vector>

#include <ovrametadata/Common.h>
#include <ovrametadata/Export.h>

namespace ovrametadata {

// Reads manifests (see ParseExtensionManifestFromDocument).
class OVRAMETADATA_EXPORT ExtensionManifestParser {
 public:
  struct ManifestInfo {
    UTF16String name;
    UTF16String version;
    UTF16String locFilePrefix;
  };
};

// What an older panel description says about its panel; the conversion of
// such panels into packages writes a manifest from it.
class OVRAMETADATA_EXPORT GenericPanelManifestParser {
 public:
  struct ManifestInfo {
    UTF16String name;
    UTF16String label;
    UTF16String description;
    UTF16String type;
    UTF16String version;
    UTF16String panelLibrary;
    UTF16String panelClass;
    UTF16String propertyDescriptionFile;
    UTF16String localizationFile;
    UTF16String modifyDate;
    UTF16String visible;
  };
};

struct ExtensionPackage {
  UTF16String path;  // the package folder, full path
  UTF16String name;
  float version = 0;
  UTF16String locFilePrefix;
};

// Reads a manifest into info (what was read, also when the file is not
// valid XML, which is reported and answered false).
OVRAMETADATA_EXPORT bool ParseExtensionManifestFromDocument(const UTF16String& path,
                                                            ExtensionManifestParser::ManifestInfo& info);
// Writes a manifest with the panel's name, version and localizationFile as
// the dictionary prefix, making its folder when missing; false when the
// folder cannot be made or the file not written.
OVRAMETADATA_EXPORT bool WriteExtensionManifest(const GenericPanelManifestParser::ManifestInfo& info,
                                                const UTF16String& path);

// The machine's and the user's package folders.
OVRAMETADATA_EXPORT UTF16String CustomExtensionsGlobalDirectory();
OVRAMETADATA_EXPORT UTF16String CustomExtensionsUserDirectory();

// Registers the packages in folder's subfolders. Never throws: each broken
// package is reported through SendError and the next one taken.
OVRAMETADATA_EXPORT void RegisterExtensionPackages(const UTF16String& folder);
// The registered packages, in registration order (LoadAllViewDefinitions
// registers both folders and loads what the packages hold).
OVRAMETADATA_EXPORT std::vector<ExtensionPackage> RegisteredExtensionPackages();

}  // namespace ovrametadata
