// ovrametadata: the address of one value inside an XMP packet, how it is
// built from definitions, and how it leads back to them.
#pragma once

#include <set>

#include <boost/optional.hpp>
#include <boost/shared_ptr.hpp>

#include <ovrametadata/Common.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Export.h>

namespace ovrametadata {

// The address of a value: a top-level property, a structure field, a
// qualifier or an array item, at any depth. A default-constructed Path (all
// strings empty) is the "no path" answer of every constructor below; test for
// it with an empty namespaceURI or description.
struct Path {
  // The creating property's internal mark; inherited by every derived path.
  bool internal = false;
  // The top-level schema's namespace URI; derived paths keep it even when a
  // field or qualifier lives in another namespace.
  UTF8String namespaceURI;
  // The toolkit's path expression relative to namespaceURI, as the toolkit's
  // composition functions write it (never built or parsed by hand).
  UTF8String description;
  // The name of the value's definition inside its container: property,
  // field or qualifier name; for an array item the element type id.
  UTF8String entry_name;
  // The container of entry_name: the schema's namespace URI for a top-level
  // property, else a type id.
  UTF8String parent_id;
};

// Orders by namespaceURI, then description; the other members take no part,
// so two paths to the same toolkit location are one key in a set or map.
OVRAMETADATA_EXPORT bool operator<(const Path& left, const Path& right);

// A property named by prefix (or, in views, namespace URI) and local name.
struct QualifiedName {
  UTF8String prefix;
  UTF8String localName;
};

// ---- Building paths from definitions ----
// Every constructor returns the empty Path when a definition it needs is
// null or missing from the registry; a missing definition is never an error.

// The path of a top-level property; empty when either pointer is null.
OVRAMETADATA_EXPORT Path CreatePathFromSchemaProperty(
    const boost::shared_ptr<SchemaDefinition>& schema,
    const boost::shared_ptr<PropertyDefinition>& property);
// As above with the property looked up by name in schema; empty when the
// schema is null or has no such property.
OVRAMETADATA_EXPORT Path CreatePathFromSchemaPropertyName(
    const boost::shared_ptr<SchemaDefinition>& schema, const UTF8String& name);
// As above with the schema looked up by namespace URI among the registered
// schemas; empty when none is registered or it lacks the property.
OVRAMETADATA_EXPORT Path PathForSchemaNameAndPropertyName(const UTF8String& schemaURI,
                                                          const UTF8String& propertyName);
OVRAMETADATA_EXPORT Path PathForSchemaNameAndPropertyName(const UTF16String& schemaURI,
                                                          const UTF16String& propertyName);

// A field of the structure at parent. Empty when field is null, parent has
// no definition or its definition names no type, or when the toolkit refuses
// the composition (e.g. the field's namespace is not registered).
OVRAMETADATA_EXPORT Path CreatePathFromStructureField(
    const Path& parent, const boost::shared_ptr<FieldDefinition>& field);
// A field of the structure held by an array item path (or by an array path
// whose elements are structures). Empty when field is null or the item's
// definition is not a structure type. Toolkit errors propagate as the
// toolkit layer's XMP_Error (a std::exception).
OVRAMETADATA_EXPORT Path CreatePathFromArrayedStructureField(
    const Path& itemPath, const boost::shared_ptr<FieldDefinition>& field);
// A qualifier of the value at parent; the qualifier lives in its own
// namespace, or in parent's namespace when it declares none. Empty when
// qualifier is null or parent's definition names no type. Unlike the field
// constructor, a composition the toolkit refuses is thrown to the caller as
// the toolkit layer's XMP_Error (a std::exception).
OVRAMETADATA_EXPORT Path CreatePathFromQualifier(
    const Path& parent, const boost::shared_ptr<QualifierDefinition>& qualifier);
// Item index (1-based; -1 is the last item) of the array at arrayPath. Empty
// when arrayPath's definition has no element type. Toolkit errors propagate
// as XMP_Error.
OVRAMETADATA_EXPORT Path CreatePathFromArrayItem(const Path& arrayPath, int index);
// The same toolkit location as path, re-linked to the definition of entry
// inside type. Empty when entry or type is null.
OVRAMETADATA_EXPORT Path CreatePathFromElementType(const Path& path,
                                                   const boost::shared_ptr<EntryDefinition>& entry,
                                                   const boost::shared_ptr<TypeDefinition>& type);

// ---- From paths back to definitions ----
// All answers are shared with the registry (null when nothing is found or
// the library is not initialised). A path of a dynamic schema resolves to a
// "text" property created for the call.

OVRAMETADATA_EXPORT boost::shared_ptr<EntryDefinition> PathEntryDefinition(const Path& path);
// The type of the value at path: for an array (IsPathAnArray(path, false))
// the element type, else the entry's own type; null when not registered.
OVRAMETADATA_EXPORT boost::shared_ptr<TypeDefinition> TypeEntryDefinition(const Path& path);
// Empty when the path has no definition or its type cannot be resolved.
OVRAMETADATA_EXPORT boost::optional<PrimitiveType> PrimitiveTypeOfPath(const Path& path);
// True for "bag" and "seq" (never "alt") when path.internal is set or force
// is true. Value access forces; navigation does not, so that arrays of
// ordinary properties are walked as plain values.
OVRAMETADATA_EXPORT bool IsPathAnArray(const Path& path, bool force);
// The first field of type named name (byte comparison); null for a null
// type or no such field.
OVRAMETADATA_EXPORT boost::shared_ptr<FieldDefinition> FieldNameDefinition(
    const boost::shared_ptr<TypeDefinition>& type, const UTF8String& name);

// The children of path, in definition order: one per field of its
// structure type, or the single element path of an internal array of a
// non-structure type. Empty for a path without definition or type. The
// range is computed while it is walked; it keeps the definitions it walks
// alive and may outlive the call.
OVRAMETADATA_EXPORT Range<Path> ChildPaths(const Path& path);
// One path per property of schema, in definition order; empty for null.
OVRAMETADATA_EXPORT Range<Path> ChildPaths(const boost::shared_ptr<SchemaDefinition>& schema);
// True when ChildPaths(path) is empty.
OVRAMETADATA_EXPORT bool IsPathLeaf(const Path& path);
// Every leaf of the tree rooted at path (path itself when it is a leaf),
// depth first in definition order. Lazy: each step resolves only what it
// needs. Meant to be walked forwards.
OVRAMETADATA_EXPORT Range<Path> DescendantLeafPaths(const Path& path);
// The leaves below every property of schema, in property order; empty for
// null.
OVRAMETADATA_EXPORT Range<Path> DescendantLeafPaths(
    const boost::shared_ptr<SchemaDefinition>& schema);

// ---- Path lists: the leaf properties a user chose to show ----
// The document ("md.paths") holds one "metadata_path" element per path with
// the five members of Path, in the set's order.

// One path's "metadata_path" element; out is cleared first.
OVRAMETADATA_EXPORT void PathAsXMLFragment(UTF8String& out, const Path& path);
// The whole document; out is cleared first.
OVRAMETADATA_EXPORT void IncludedLeafPathsAsXMLString(const std::set<Path>& paths, UTF8String& out);
// Adds the stored paths that still have a definition and are leaves (the
// others are dropped silently, so that lists survive definition changes).
// False when the document is not well-formed XML; never throws.
OVRAMETADATA_EXPORT bool ReadIncludedLeafPathsAsXMLString(std::set<Path>& paths, const UTF8String& document);
OVRAMETADATA_EXPORT bool ReadIncludedLeafPathsAsXMLFile(std::set<Path>& paths, const UTF16String& file);

// ---- Which properties panels show ----
// The host's own block list (only namespace and description count).
OVRAMETADATA_EXPORT void BlacklistPropertyForClient(const Path& path, bool blocked);
OVRAMETADATA_EXPORT bool IsPropertyBlacklistedByClient(const Path& path);
// The library's: the raw converter's tone curve, which no panel can edit.
OVRAMETADATA_EXPORT bool IsPropertyBlacklistedInternally(const Path& path);
// False for blocked properties and for choices and alternatives whose
// elements cannot be shown as one (a choice of dates, say).
OVRAMETADATA_EXPORT bool IsPropertyUISupported(const Path& path);

}  // namespace ovrametadata
