// ovrametadata: recently used values, one list per key (a property's name,
// say), kept in memory and saved in "PropsheetMRU.xml" below the per-user
// data root. The host decides the order and length of each list and when
// to load and save; the library neither reorders nor trims them.
#pragma once

#include <list>
#include <map>

#include <ovrametadata/Common.h>
#include <ovrametadata/Export.h>

namespace ovrametadata {

using MRULists = std::map<UTF8String, std::list<UTF16String>>;

// The lists in memory, by key.
OVRAMETADATA_EXPORT MRULists GetMRULists();
// Replaces the key's list (or adds the key) with values, in their order.
OVRAMETADATA_EXPORT void UpdateMRULists(UTF8String key, std::list<UTF16String> values);
// Empties the lists in memory; the file stays.
OVRAMETADATA_EXPORT void ClearMRUList();
// Reads the file: its lists replace those of the same keys in memory. A
// missing, malformed, truncated, empty or unreadable file changes nothing
// and never throws.
OVRAMETADATA_EXPORT void LoadMRUFile();
// Writes every list to the file (a new file renamed over the old one);
// false when it could not be written.
OVRAMETADATA_EXPORT bool SerializeMRUList();
// Deletes the file; false when there was none or it could not be removed.
OVRAMETADATA_EXPORT bool RemoveMRUFile();
// The file's folder, full path; empty when there is no per-user root.
OVRAMETADATA_EXPORT UTF16String MRUDirectory();

}  // namespace ovrametadata
