// Building paths from definitions and resolving them back.
#include <ovrametadata/Paths.h>

#include <utility>

#include <boost/pointer_cast.hpp>

#include <ovracore/Strings.h>
#include <ovraxmp/XMPToolkit.h>

#include "paths/PathsInternal.h"

namespace ovrametadata {

namespace {

// The one place where the five members are put together.
Path MakePath(bool internal, UTF8String namespaceURI, UTF8String description,
              UTF8String entryName, UTF8String parentId) {
  Path path;
  path.internal = internal;
  path.namespaceURI = std::move(namespaceURI);
  path.description = std::move(description);
  path.entry_name = std::move(entryName);
  path.parent_id = std::move(parentId);
  return path;
}

bool IsBagOrSeq(const boost::optional<PrimitiveType>& type) {
  return type && (*type == kPrimitiveType_bag || *type == kPrimitiveType_seq);
}

UTF8String ComposeStructField(const Path& parent, const UTF8String& fieldNS,
                              const UTF8String& fieldName) {
  std::string composed;
  composed = ovraxmp::XMPUtils::ComposeStructFieldPath(parent.namespaceURI, parent.description, fieldNS,
                                            fieldName);
  return composed;
}

}  // namespace

bool operator<(const Path& left, const Path& right) {
  const int byNamespace = left.namespaceURI.compare(right.namespaceURI);
  if (byNamespace != 0) return byNamespace < 0;
  return left.description < right.description;
}

// ---------------------------------------------------------------------------
// Constructors

Path CreatePathFromSchemaProperty(const boost::shared_ptr<SchemaDefinition>& schema,
                                  const boost::shared_ptr<PropertyDefinition>& property) {
  if (!schema || !property) return Path();
  return MakePath(property->isInternal, schema->namespaceURI, property->name, property->name,
                  schema->namespaceURI);
}

Path CreatePathFromSchemaPropertyName(const boost::shared_ptr<SchemaDefinition>& schema,
                                      const UTF8String& name) {
  if (!schema) return Path();
  return CreatePathFromSchemaProperty(schema, PropertyNameDefinition(schema, name));
}

Path PathForSchemaNameAndPropertyName(const UTF8String& schemaURI,
                                      const UTF8String& propertyName) {
  Path path;
  if (auto schema = NamespaceDefinition(schemaURI)) {
    path = CreatePathFromSchemaPropertyName(schema, propertyName);
  }
  return path;
}

Path PathForSchemaNameAndPropertyName(const UTF16String& schemaURI,
                                      const UTF16String& propertyName) {
  return PathForSchemaNameAndPropertyName(ovracore::ToUTF8(schemaURI),
                                          ovracore::ToUTF8(propertyName));
}

Path CreatePathFromStructureField(const Path& parent,
                                  const boost::shared_ptr<FieldDefinition>& field) {
  if (!field) return Path();
  const auto entry = PathEntryDefinition(parent);
  if (!entry || !entry->type) return Path();
  try {
    return MakePath(parent.internal, parent.namespaceURI,
                    ComposeStructField(parent, field->namespaceURI, field->name), field->name,
                    *entry->type);
  } catch (const ovraxmp::XMP_Error&) {
    // A field the toolkit cannot address (its namespace is unknown) is simply
    // not a path; callers walking a structure skip it.
    return Path();
  }
}

namespace detail {

// The structure type held by an array item path. The children of an
// internal array of structures are composed on the array path itself, so an
// array whose elements are structures qualifies too.
boost::shared_ptr<TypeDefinition> ArrayedStructureType(const Path& itemPath) {
  const auto entry = PathEntryDefinition(itemPath);
  if (!entry) return boost::shared_ptr<TypeDefinition>();
  auto type = boost::dynamic_pointer_cast<TypeDefinition>(entry);
  if (type && IsStructType(*type)) return type;
  if (IsEntryAnArray(itemPath, *entry, false)) {
    type = TypeOfEntry(itemPath, *entry);
    if (type && IsStructType(*type)) return type;
  }
  return boost::shared_ptr<TypeDefinition>();
}

}  // namespace detail

Path CreatePathFromArrayedStructureField(const Path& itemPath,
                                         const boost::shared_ptr<FieldDefinition>& field) {
  if (!field) return Path();
  const auto structType = detail::ArrayedStructureType(itemPath);
  if (!structType) return Path();
  return MakePath(itemPath.internal, itemPath.namespaceURI,
                  ComposeStructField(itemPath, field->namespaceURI, field->name), field->name,
                  structType->name);
}

Path CreatePathFromQualifier(const Path& parent,
                             const boost::shared_ptr<QualifierDefinition>& qualifier) {
  if (!qualifier) return Path();
  const auto entry = PathEntryDefinition(parent);
  if (!entry || !entry->type) return Path();
  const UTF8String& qualifierNS =
      qualifier->namespaceURI.empty() ? parent.namespaceURI : qualifier->namespaceURI;
  std::string composed;
  // Deliberately not caught: a qualifier that cannot be addressed is the
  // caller's error, unlike a structure field.
  composed = ovraxmp::XMPUtils::ComposeQualifierPath(parent.namespaceURI, parent.description, qualifierNS,
                                          qualifier->name);
  return MakePath(parent.internal, parent.namespaceURI, std::move(composed), qualifier->name,
                  *entry->type);
}

Path CreatePathFromArrayItem(const Path& arrayPath, int index) {
  const auto entry = PathEntryDefinition(arrayPath);
  if (!entry) return Path();
  const auto elementType = ElementTypeIdOf(*entry);
  if (!elementType) return Path();
  const std::string composed =
      ovraxmp::XMPUtils::ComposeArrayItemPath(arrayPath.namespaceURI, arrayPath.description, index);
  UTF8String parentId;
  if (const auto type = detail::TypeOfEntry(arrayPath, *entry)) {
    if (const auto primitive = PrimitiveTypeOf(*type)) {
      parentId = PrimitiveTypeAsPrimitiveTypeId(*primitive);
    } else if (type->type) {
      parentId = *type->type;
    }
  }
  return MakePath(arrayPath.internal, arrayPath.namespaceURI, std::move(composed), *elementType,
                  std::move(parentId));
}

Path CreatePathFromElementType(const Path& path, const boost::shared_ptr<EntryDefinition>& entry,
                               const boost::shared_ptr<TypeDefinition>& type) {
  if (!entry || !type) return Path();
  return MakePath(path.internal, path.namespaceURI, path.description, entry->name, type->name);
}

// ---------------------------------------------------------------------------
// Resolution

boost::shared_ptr<EntryDefinition> PathEntryDefinition(const Path& path) {
  if (const auto schema = NamespaceDefinition(path.parent_id)) {
    if (schema->isDynamic || IsDynamicNamespace(schema->namespaceURI)) {
      // Properties of a dynamic schema are not declared beforehand: any
      // name is a text property.
      const UTF16String name = ovracore::ToUTF16(path.entry_name);
      return CreateNewProperty(kPrimitiveType_text, path.entry_name, name, name, UTF16String(),
                               UTF16String());
    }
    if (auto property = PropertyNameDefinition(schema, path.entry_name)) return property;
  }
  if (const auto owner = TypeIdDefinition(path.parent_id)) {
    if (auto field = FieldNameDefinition(owner, path.entry_name)) return field;
  }
  // Array items name their element type directly.
  return TypeIdDefinition(path.entry_name);
}

namespace detail {

boost::optional<PrimitiveType> PrimitiveTypeOfEntry(const EntryDefinition& entry) {
  if (entry.type) {
    if (const auto primitive = PrimitiveTypeIdAsPrimitiveType(*entry.type)) return primitive;
    const auto type = TypeIdDefinition(*entry.type);
    return type ? PrimitiveTypeOf(*type) : boost::none;
  }
  return entry.extends;
}

bool IsEntryAnArray(const Path& path, const EntryDefinition& entry, bool force) {
  if (!IsBagOrSeq(PrimitiveTypeOfEntry(entry))) return false;
  return path.internal || force;
}

boost::shared_ptr<TypeDefinition> TypeOfEntry(const Path& path, const EntryDefinition& entry) {
  if (IsEntryAnArray(path, entry, false)) {
    const auto elementType = ElementTypeIdOf(entry);
    return elementType ? TypeIdDefinition(*elementType) : boost::shared_ptr<TypeDefinition>();
  }
  return entry.type ? TypeIdDefinition(*entry.type) : boost::shared_ptr<TypeDefinition>();
}

}  // namespace detail

boost::shared_ptr<TypeDefinition> TypeEntryDefinition(const Path& path) {
  const auto entry = PathEntryDefinition(path);
  return entry ? detail::TypeOfEntry(path, *entry) : boost::shared_ptr<TypeDefinition>();
}

boost::optional<PrimitiveType> PrimitiveTypeOfPath(const Path& path) {
  const auto entry = PathEntryDefinition(path);
  if (!entry) return boost::none;
  return detail::PrimitiveTypeOfEntry(*entry);
}

bool IsPathAnArray(const Path& path, bool force) {
  const auto entry = PathEntryDefinition(path);
  return entry && detail::IsEntryAnArray(path, *entry, force);
}

boost::shared_ptr<FieldDefinition> FieldNameDefinition(
    const boost::shared_ptr<TypeDefinition>& type, const UTF8String& name) {
  if (!type) return boost::shared_ptr<FieldDefinition>();
  for (const auto& field : type->fields) {
    if (field && field->name == name) return field;
  }
  return boost::shared_ptr<FieldDefinition>();
}

}  // namespace ovrametadata
