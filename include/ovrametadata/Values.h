// ovrametadata: typed reading and writing of values in an XMP packet,
// addressed by Path.
//
// Every function takes the packet as an XMPMetaRef; a null handle is legal
// and means "no packet". Nothing throws: problems in the data are reported
// through SendError (kErrorReadingXMP for reads, kErrorWritingXMP for
// writes). The functions keep no state; the caller serialises access to one
// packet (the providers' access guards do).
#pragma once

#include <vector>

#include <ovrametadata/Common.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {

// The outcome of a read, written through the optional result pointer of
// every reader (which sets ValueAbsent on entry).
enum GetValueResult : int {
  ValueFound = 0,   // the value exists and was read
  ValueMixed = 1,   // the toolkit marks the property multi-valued; nothing read
  ValueAbsent = 2,  // no packet, or the property does not exist
  ValueError = 3    // no definition (text and date reads), or unreadable data
};

// ---- Readers ----
// Each returns true when it read a value; on false the out value is left
// as it was. `result` may be null.

// Typed reads through the toolkit's own conversions; no definition is
// consulted and nothing is formatted.
OVRAMETADATA_EXPORT bool GetValue(XMPMetaRef xmp, const Path& path, bool& value,
                                  GetValueResult* result = nullptr);
OVRAMETADATA_EXPORT bool GetValue(XMPMetaRef xmp, const Path& path, int& value,
                                  GetValueResult* result = nullptr);
OVRAMETADATA_EXPORT bool GetValue(XMPMetaRef xmp, const Path& path, long long& value,
                                  GetValueResult* result = nullptr);
OVRAMETADATA_EXPORT bool GetValue(XMPMetaRef xmp, const Path& path, double& value,
                                  GetValueResult* result = nullptr);
// A property whose definition has the type "date", converted to UTC. False
// with ValueError when the path has no definition; false when its type is
// not "date".
OVRAMETADATA_EXPORT bool GetValue(XMPMetaRef xmp, const Path& path, Date& value,
                                  GetValueResult* result = nullptr);
// The text of the value, read in the storage form its definition gives
// (arrays catenated with "; ", alternatives in "x-default", dates
// normalised). Internal properties come formatted for display, and when
// nothing is stored, constructed from other properties. Text that does not
// fit the declared type is reported but still delivered.
OVRAMETADATA_EXPORT bool GetValue(XMPMetaRef xmp, const Path& path, UTF8String& value,
                                  GetValueResult* result = nullptr);
// The stored text of a simple property exactly as it stands: no definition,
// validation, formatting or constructed value.
OVRAMETADATA_EXPORT bool GetRawStringValue(XMPMetaRef xmp, const Path& path, UTF8String& value,
                                           GetValueResult* result = nullptr);

// ---- Writers ----
// Each returns true when it wrote. A value equal to the stored one is not
// written (false), unless the property is multi-valued: then it is always
// written and its multi-value mark cleared. What was written is read back;
// a difference is reported but the write still counts.

OVRAMETADATA_EXPORT bool SetValue(XMPMetaRef xmp, const Path& path, bool value);
OVRAMETADATA_EXPORT bool SetValue(XMPMetaRef xmp, const Path& path, int value);
OVRAMETADATA_EXPORT bool SetValue(XMPMetaRef xmp, const Path& path, long long value);
OVRAMETADATA_EXPORT bool SetValue(XMPMetaRef xmp, const Path& path, double value);
// Writes text in the storage form the definition gives (for arrays, the
// text is split into items at ";"). False for a path without definition or
// without a known type.
OVRAMETADATA_EXPORT bool SetValue(XMPMetaRef xmp, const Path& path, const UTF8String& value);
// Keeps a string literal from converting to bool and taking the bool writer.
inline bool SetValue(XMPMetaRef xmp, const Path& path, const char* value) {
  return SetValue(xmp, path, UTF8String(value ? value : ""));
}

// ---- Language alternatives, one language at a time ----
// The functions above read and write the "x-default" item; these reach the
// others. Tags compare without regard to case.

// The languages of the alternative at path, in stored order ("x-default"
// included); empty when it is absent.
OVRAMETADATA_EXPORT std::vector<UTF8String> GetAltTextLanguages(XMPMetaRef xmp, const Path& path);
// The item of exactly that language: no other language stands in for it.
OVRAMETADATA_EXPORT bool GetAltTextValue(XMPMetaRef xmp, const Path& path,
                                         const UTF8String& language, UTF8String& value,
                                         GetValueResult* result = nullptr);
// Writes the item of that language only, adding it when absent (a new
// alternative gets an "x-default" item with the same text). False, with a
// report, when the definition of path is not a language alternative or the
// tag is not one ("en", "de-CH").
OVRAMETADATA_EXPORT bool SetAltTextValue(XMPMetaRef xmp, const Path& path,
                                         const UTF8String& language, const UTF8String& value);

// ---- What a packet stores, read without definitions ----
// For namespaces the definitions do not describe: the functions above need
// a definition, these show what is there.

struct StoredNamespace {
  UTF8String namespaceURI;
  UTF8String prefix;  // the prefix the toolkit knows it by, without colon
};

// One stored node: a simple value, a structure or an array.
struct StoredNode {
  enum Kind { kSimple, kStruct, kArray };
  Kind kind = kSimple;
  UTF8String name;      // "lr:hierarchicalSubject", "stDim:w"; "[2]" for an item
  UTF8String value;     // of a simple value
  UTF8String language;  // the value's xml:lang, when it has one
  std::vector<StoredNode> children;  // fields or items, in stored order
};

// The namespaces that hold properties in the packet, in its order.
OVRAMETADATA_EXPORT std::vector<StoredNamespace> GetStoredNamespaces(XMPMetaRef xmp);
// The properties stored in namespaceURI, in order; empty when none.
OVRAMETADATA_EXPORT std::vector<StoredNode> GetStoredNodes(XMPMetaRef xmp,
                                                           const UTF8String& namespaceURI);

}  // namespace ovrametadata
