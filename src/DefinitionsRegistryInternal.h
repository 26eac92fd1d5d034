// Not part of the interface: the registry's tables as start-up and the
// loaders fill and empty them.
#pragma once

#include <ovrametadata/Definitions.h>

namespace ovrametadata {

// The base of every dynamic-schema namespace; stored in clients' files, so
// it must never change.
extern const char* const kDynamicSchemaBaseURI;

// Sets a missing type to "text", and a missing element type of a choice or
// array to "text", reporting each repair with prefix:name.
void FixupPropertyOrFieldDefinition(UTF8String const& prefix,
                                    boost::shared_ptr<EntryDefinition> const& entry,
                                    UTF16String const& source);

void AddCommonSchemaDefinition(SchemaDefinitionPtr const& schema);
void AddDynamicSchemaDefinition(SchemaDefinitionPtr const& schema);
bool HasStandardSchemaNamespace(StandardSchema schema);
void SetStandardSchemaNamespace(StandardSchema schema, UTF8String const& namespaceURI);
void SetFilePathForType(UTF16String const& path, TypeDefinitionPtr const& type);

// Empties, in this order: the dynamic and common schema lists, the standard
// schema namespaces, the types, the schemas, the schema and type file paths.
void ClearDefinitionsRegistry();

}  // namespace ovrametadata
