// Not part of the interface: the library frame's internal entry points,
// shared by start-up, the registry and the loaders of later subsystems.
#pragma once

#include <boost/function.hpp>

#include <ovracore/FileSupport.h>
#include <ovracore/Resources.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>

// The resources compiled into the library (generated at build time).
const ovracore::ResourceTable& ovrametadataResources();

namespace ovrametadata {

// True between the first Initialize and the last Terminate; every table
// answers nothing while it is false.
bool IsLibraryInitialized();
// The library's own resources while it is initialised, else null.
const ovracore::ResourceTable* LibraryResources();

// --- Error and switch state (Errors.cpp, Switches.cpp).
// Drop the withdrawn (emptied) entries of a callback list.
void DeleteEmptyErrorCallbacks();
void DeleteEmptyXMPWritingCallbacks();
// Release every entry of a callback list. The lists themselves live as long
// as the process, so a registration after the last Terminate is harmless.
void ClearErrorCallbacks();
void ClearXMPWritingCallbacks();
// Forgets every recorded error.
void ClearErrorList();

// The folder of extension packages, relative to either data root.
extern const UTF16String kCustomExtensionPath;

// --- Definitions loaders (Initialize.cpp), also used by extension packages.
// Parses and registers the built-in resource of that name and type "xml";
// an empty pair when there is no such resource.
DefinitionsPair LoadDefinitionsFromResource(UTF16String const& name);
// Loads every ".xml" file of the folder (a missing folder is skipped), with
// its "loc" dictionary, skipping the names `exclude` answers true for.
void LoadDefinitionsDirectory(UTF16String const& folder,
                              boost::function<bool(UTF16String const&)> const& exclude);
// Parses and registers one file (merging into registered schemas when it
// is not from a custom folder) and files its definitions under the common
// or dynamic list and under the file's path.
void LoadDefinitionsFromFile(ovracore::filesupport::File const& file, bool isCustomFolder);

// Writes text to path through safe save (a new file renamed over the old
// one), making the folder first. False only when the folder cannot be made;
// written, when given, says whether the file was written.
bool StoreText(UTF16String const& path, UTF8String const& text, bool* written = nullptr);

}  // namespace ovrametadata
