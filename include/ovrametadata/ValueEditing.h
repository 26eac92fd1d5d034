// ovrametadata: presence and deletion of values, the deletion records of
// aggregate packets, array items, templates and the minimal float write.
//
// All functions take the packet as a handle (null: no packet) and a Path
// (see Paths.h). Packets are not locked: use them through a provider's guard
// (Providers.h) from one thread at a time.
#pragma once

#include <vector>

#include <boost/shared_ptr.hpp>

#include <ovrametadata/Common.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {

class MetaDataProvider;

// A value handle: where the value lives and the provider that holds it.
struct Value {
  Path path;
  boost::shared_ptr<MetaDataProvider> provider;
};

// How ApplyTemplate merges a template into a packet.
enum TemplateImportOptions : int {
  // Clear properties the template does not name; replace existing ones.
  TemplateReplaceAll = 0,
  // Clear properties the template does not name.
  TemplateClearUnnamed = 1,
  // Replace existing properties, deleting those whose template value is empty.
  TemplateReplaceDeleteEmpty = 2,
  // Any further value applies the template with no flags at all.
};

// ---- Presence and deletion ----

// Whether the property exists; false for a null packet or a toolkit error
// (reported as kErrorReadingXMP).
OVRAMETADATA_EXPORT bool HasValue(XMPMetaRef xmp, const Path& path);

// Deletes the value at path and answers whether something was deleted or
// emptied. An item of an array is emptied instead of removed, so that the
// other items keep their indices; a structure left empty by deleting its
// field is removed as well. A multi-valued property (aggregate of files
// whose values differ) keeps its value: only its multi-value mark is cleared
// and the deletion is recorded. False for a null packet, a missing value or
// a toolkit error (reported as kErrorWritingXMP).
OVRAMETADATA_EXPORT bool DeleteValue(XMPMetaRef xmp, const Path& path);

// In a packet that aggregates several files, appends a record of the
// deletion of path to the transient "DeletedProperties" list, so that the
// aggregate provider deletes it in every file. Does nothing for a null
// packet or one that is not an aggregate. Toolkit errors are reported as
// kErrorReadingXMP.
OVRAMETADATA_EXPORT void MarkMultiValueDeleted(XMPMetaRef xmp, const Path& path);

// ---- Arrays ----
// Indices are 0-based; -1 names the last item. The array is addressed by
// the path's namespace and entry name (top-level arrays). Toolkit errors are
// reported (reading: kErrorReadingXMP, writing: kErrorWritingXMP); other
// exceptions reach the caller.

// Number of items; 0 for a null packet, an absent array or a path that is
// not a bag or seq.
OVRAMETADATA_EXPORT int CountArrayItems(XMPMetaRef xmp, const Path& path);

// Inserts one empty item so that it takes position index (-1: before the
// last item). On an absent or empty array, appends the first item and
// creates the array (ordered for seq). Items of structure-typed arrays are
// structures. False for a null packet, a non-array path or a toolkit error;
// true without change when the array is empty and its type unknown.
OVRAMETADATA_EXPORT bool AddArrayItem(XMPMetaRef xmp, const Path& path, int index);

// Deletes one item; deleting the last remaining item deletes the property
// (and records the deletion in an aggregate packet). False for a null
// packet, a non-array path or a toolkit error.
OVRAMETADATA_EXPORT bool DeleteArrayItem(XMPMetaRef xmp, const Path& path, int index);

// ---- Templates ----

// Applies templateXMP to destination as options say. False when either
// handle is null or the toolkit refuses (reported as kErrorWritingXMP).
OVRAMETADATA_EXPORT bool ApplyTemplate(XMPMetaRef destination, XMPMetaRef templateXMP,
                                       TemplateImportOptions options);

// ---- Copying ----

// Copies each value at paths (whole: structures and arrays with everything
// below them) from source into destination, replacing what destination
// holds there; a value source lacks is deleted from destination. Answers
// the paths whose value in destination changed. Toolkit errors are reported
// (kErrorWritingXMP) and leave that path as it was.
OVRAMETADATA_EXPORT std::vector<Path> CopyValues(XMPMetaRef source, XMPMetaRef destination,
                                                 const std::vector<Path>& paths);

// ---- Minimal float ----

// Stores number at value.path in the provider's packet as the shortest
// text that reads back exactly (17 significant digits at most), through an
// update guard, so the provider writes it back. Writes nothing when the
// stored number already equals it; does nothing without provider or packet.
// Every failure is reported as kErrorWritingXMP, never thrown.
OVRAMETADATA_EXPORT void SetMinimalFloatValue(const Value& value, double number);

}  // namespace ovrametadata
