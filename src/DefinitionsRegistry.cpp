// The registry of schema and type definitions.
#include <algorithm>
#include <map>

#include <ovracore/Localizer.h>
#include <ovraxmp/XMPMeta.h>

#include "DefinitionsRegistryInternal.h"
#include "InitializeInternal.h"

namespace ovrametadata {

const char* const kDynamicSchemaBaseURI = "http://ns.ovrametadata.org/ovra/dynamic/";

namespace {

// Filled during start-up and extension loading on one thread; read
// afterwards, hence no lock.
std::map<UTF8String, TypeDefinitionPtr> sTypeDefinitions;
std::map<UTF8String, SchemaDefinitionPtr> sSchemaDefinitions;
std::vector<SchemaDefinitionPtr> sCommonSchemaDefinitions;
std::vector<SchemaDefinitionPtr> sDynamicSchemaDefinitions;
std::map<StandardSchema, UTF8String> sStandardSchemaNamespace;
std::map<SchemaDefinitionPtr, UTF16String> sSchemaToFilePath;
std::map<TypeDefinitionPtr, UTF16String> sTypeToFilePath;

void ReportRegistrationError(std::string_view text, std::initializer_list<std::string_view> args,
                             UTF16String const& source) {
  SendError(kDefinitionRegistrationError, ovracore::ZString(text, args), source);
}

bool IsChoiceOrArrayKind(boost::optional<PrimitiveType> const& type) {
  return type && (PrimitiveTypeIsChoice(*type) || PrimitiveTypeIsArray(*type));
}

// Registers a namespace with the toolkit; false when the toolkit refuses the
// prefix or fails (its exceptions stay here: the caller reports them).
bool RegisterNamespaceWithToolkit(UTF8String const& namespaceURI, UTF8String const& prefix) {
  try {
    std::string registered;
    return ovraxmp::XMPMeta::RegisterNamespace(namespaceURI, prefix, &registered);
  } catch (...) {
    return false;
  }
}

void ReportNamespaceRegistration(UTF8String const& namespaceURI, UTF8String const& prefix,
                                 UTF16String const& source) {
  ReportRegistrationError(
      "$$$/ovrametadata/ErrorInNamespaceRegistration=namespace #{quot}@0#{quot} couldn't be "
      "registered with prefix #{quot}@1#{quot}.",
      {namespaceURI, prefix}, source);
}

// Reports an entry whose type, or element type, names no registered type.
void CheckEntryType(UTF8String const& prefix, EntryDefinition const& entry,
                    UTF16String const& source) {
  if (!entry.type) return;
  if (IsChoiceOrArrayKind(PrimitiveTypeOf(entry))) {
    const auto element = ElementTypeIdOf(entry);
    if (element && !TypeIdDefinition(*element)) {
      ReportRegistrationError(
          "$$$/ovrametadata/ErrorInArrayOrChoice/InvalidElementType=XMP property "
          "#{quot}@0:@1#{quot} has an invalid element type #{quot}@2#{quot}.",
          {prefix, entry.name, *element}, source);
    }
  } else if (!TypeIdDefinition(*entry.type)) {
    ReportRegistrationError(
        "$$$/ovrametadata/ErrorInField/InvalidType=XMP property #{quot}@0:@1#{quot} has an "
        "invalid type #{quot}@2#{quot}.",
        {prefix, entry.name, *entry.type}, source);
  }
}

template <class Definition>
std::vector<boost::shared_ptr<Definition>> AllFromSourceFile(
    std::map<boost::shared_ptr<Definition>, UTF16String> const& paths, UTF16String const& path) {
  std::vector<boost::shared_ptr<Definition>> found;
  for (auto const& entry : paths) {
    if (entry.second == path) found.push_back(entry.first);
  }
  return found;
}

}  // namespace

// --- Registration

bool RegisterTypeDefinition(TypeDefinitionPtr const& type, UTF16String const& source) {
  if (!type || !IsLibraryInitialized()) return false;
  if (sTypeDefinitions.count(type->name)) {
    ReportRegistrationError(
        "$$$/ovrametadata/ErrorInTypeRegistration/duplicateTypeDefinition=type definition for "
        "#{quot}@0#{quot} already exists.",
        {type->name}, source);
    return false;
  }
  sTypeDefinitions[type->name] = type;
  type->type = type->name;

  if (!IsStructType(*type) && IsChoiceOrArrayKind(type->extends) &&
      !type->constraints.elementType) {
    type->constraints.elementType = UTF8String("text");
    ReportRegistrationError(
        "$$$/ovrametadata/ErrorInArrayOrChoice/InvalidElementTypeInTypeChangedToDefault=invalid "
        "element type for type #{quot}@0#{quot} is changed to default type 'text'.",
        {type->name}, source);
  }
  for (auto const& field : type->fields) {
    if (field) FixupPropertyOrFieldDefinition(field->prefix, field, source);
  }
  bool allRegistered = true;
  for (auto const& field : type->fields) {
    if (!field) continue;
    if (!RegisterNamespaceWithToolkit(field->namespaceURI, field->prefix)) {
      ReportNamespaceRegistration(field->namespaceURI, field->prefix, source);
      allRegistered = false;
    }
  }
  if (allRegistered) return true;

  sTypeDefinitions.erase(type->name);
  ReportRegistrationError(
      "$$$/ovrametadata/ErrorInTypeRegistration/invalidType=invalid Type #{quot}@0#{quot}.",
      {type->name}, source);
  return false;
}

bool RegisterSchemaDefinition(SchemaDefinitionPtr const& schema, UTF16String const& source,
                              bool mergeIntoExisting) {
  if (!schema || !IsLibraryInitialized()) return false;
  const auto registered = sSchemaDefinitions.find(schema->namespaceURI);
  if (registered == sSchemaDefinitions.end()) {
    sSchemaDefinitions[schema->namespaceURI] = schema;
    // A refused prefix leaves the schema usable: the toolkit writes it under
    // the prefix it chose.
    if (!RegisterNamespaceWithToolkit(schema->namespaceURI, schema->prefix)) {
      ReportNamespaceRegistration(schema->namespaceURI, schema->prefix, source);
    }
    for (auto const& property : schema->properties) {
      if (property) FixupPropertyOrFieldDefinition(schema->prefix, property, source);
    }
    return true;
  }
  if (!mergeIntoExisting) {
    ReportRegistrationError(
        "$$$/ovrametadata/ErrorInSchemaRegistration/duplicateSchemaDefinition=schema definition "
        "for #{quot}@0#{quot} already exists.",
        {schema->namespaceURI}, source);
    return false;
  }
  SchemaDefinition& target = *registered->second;
  for (auto const& property : schema->properties) {
    if (!property) continue;
    if (PropertyNameDefinition(registered->second, property->name)) {
      ReportRegistrationError(
          "$$$/ovrametadata/ErrorInSchemaRegistration/duplicatePropertyDefinition=property "
          "definition for namespace #{quot}@0@1#{quot} already exists.",
          {schema->namespaceURI, property->name}, source);
      continue;
    }
    target.properties.push_back(property);
    FixupPropertyOrFieldDefinition(target.prefix, property, source);
  }
  // False although properties merged: the merged schema is not a new one.
  return false;
}

bool RegisterTypeDefinitions(std::vector<TypeDefinitionPtr> const& types,
                             UTF16String const& source) {
  bool all = true;
  for (auto const& type : types) all = RegisterTypeDefinition(type, source) && all;
  return all;
}

bool RegisterSchemaDefinitions(std::vector<SchemaDefinitionPtr> const& schemas,
                               UTF16String const& source, bool mergeIntoExisting) {
  bool all = true;
  for (auto const& schema : schemas) {
    all = RegisterSchemaDefinition(schema, source, mergeIntoExisting) && all;
  }
  return all;
}

bool RemoveTypeDefinition(TypeDefinitionPtr const& type) {
  if (!type || !IsLibraryInitialized()) return false;
  return sTypeDefinitions.erase(type->name) > 0;
}

bool RemoveSchemaDefinition(SchemaDefinitionPtr const& schema) {
  if (!schema || !IsLibraryInitialized()) return false;
  return sSchemaDefinitions.erase(schema->namespaceURI) > 0;
}

bool IsSchemaDefinitionAlreadyRegistered(SchemaDefinitionPtr const& schema) {
  return schema && IsLibraryInitialized() && sSchemaDefinitions.count(schema->namespaceURI) > 0;
}

// --- Lookup

TypeDefinitionPtr TypeIdDefinition(UTF8String const& typeId) {
  if (!IsLibraryInitialized()) return {};
  const auto found = sTypeDefinitions.find(typeId);
  return found == sTypeDefinitions.end() ? TypeDefinitionPtr() : found->second;
}

SchemaDefinitionPtr NamespaceDefinition(UTF8String const& namespaceURI) {
  if (!IsLibraryInitialized()) return {};
  const auto found = sSchemaDefinitions.find(namespaceURI);
  return found == sSchemaDefinitions.end() ? SchemaDefinitionPtr() : found->second;
}

PropertyDefinitionPtr PropertyNameDefinition(SchemaDefinitionPtr const& schema,
                                             UTF8String const& name) {
  if (!schema || !IsLibraryInitialized()) return {};
  for (auto const& property : schema->properties) {
    if (property && property->name == name) return property;
  }
  return {};
}

UTF8String StandardSchemaNamespace(StandardSchema schema) {
  if (!IsLibraryInitialized()) return {};
  const auto found = sStandardSchemaNamespace.find(schema);
  return found == sStandardSchemaNamespace.end() ? UTF8String() : found->second;
}

Range<SchemaDefinitionPtr> CommonSchemaDefinitions() {
  if (!IsLibraryInitialized()) return Range<SchemaDefinitionPtr>();
  return Range<SchemaDefinitionPtr>(sCommonSchemaDefinitions);
}

Range<SchemaDefinitionPtr> DynamicSchemaDefinitions() {
  if (!IsLibraryInitialized()) return Range<SchemaDefinitionPtr>();
  return Range<SchemaDefinitionPtr>(sDynamicSchemaDefinitions);
}

// --- Dynamic namespaces

UTF8String MakeDynamicSchemaNamespace(UTF8String const& name) {
  UTF8String path = name;
  if (!path.empty() && path.front() == '/') path.erase(0, 1);
  if (!path.empty() && path.back() == '/') path.pop_back();
  return kDynamicSchemaBaseURI + path + "/1.0/";
}

bool IsDynamicNamespace(UTF8String const& namespaceURI) {
  return namespaceURI.find(kDynamicSchemaBaseURI) != UTF8String::npos;
}

// --- Source files

void SetFilePathForSchema(UTF16String const& path, SchemaDefinitionPtr schema) {
  if (schema) sSchemaToFilePath[schema] = path;
}

UTF16String filePathForSchema(SchemaDefinitionPtr schema) {
  const auto found = sSchemaToFilePath.find(schema);
  return found == sSchemaToFilePath.end() ? UTF16String() : found->second;
}

void SetFilePathForType(UTF16String const& path, TypeDefinitionPtr const& type) {
  if (type) sTypeToFilePath[type] = path;
}

std::vector<SchemaDefinitionPtr> allSchemasFromSourceFile(UTF16String const& path) {
  return AllFromSourceFile(sSchemaToFilePath, path);
}

std::vector<TypeDefinitionPtr> allTypesFromSourceFile(UTF16String const& path) {
  return AllFromSourceFile(sTypeToFilePath, path);
}

// --- Repair and checks

void FixupPropertyOrFieldDefinition(UTF8String const& prefix,
                                    boost::shared_ptr<EntryDefinition> const& entry,
                                    UTF16String const& source) {
  if (!entry) return;
  if (!entry->type) {
    entry->type = UTF8String("text");
    ReportRegistrationError(
        "$$$/ovrametadata/ErrorInProperty/InvalidTypeChangedToDefault=invalid type for XMP "
        "property #{quot}@0:@1#{quot} is changed to default type 'text'.",
        {prefix, entry->name}, source);
    return;
  }
  if (IsChoiceOrArrayKind(PrimitiveTypeOf(*entry)) && !entry->constraints.elementType) {
    const auto type = TypeIdDefinition(*entry->type);
    if (type && !type->constraints.elementType) {
      entry->constraints.elementType = UTF8String("text");
      ReportRegistrationError(
          "$$$/ovrametadata/ErrorInArrayOrChoice/InvalidElementTypeChangedToDefault=invalid "
          "element type for XMP property #{quot}@0:@1#{quot} is changed to default type 'text'.",
          {prefix, entry->name}, source);
    }
  }
}

bool CheckPropertyTypes(std::vector<SchemaDefinitionPtr> const& schemas,
                        UTF16String const& source) {
  for (auto const& schema : schemas) {
    if (!schema) continue;
    for (auto const& property : schema->properties) {
      if (property) CheckEntryType(schema->prefix, *property, source);
    }
  }
  return true;
}

bool CheckFieldTypes(std::vector<TypeDefinitionPtr> const& types, UTF16String const& source) {
  for (auto const& type : types) {
    if (!type) continue;
    if (IsStructType(*type)) {
      for (auto const& field : type->fields) {
        if (field) CheckEntryType(field->prefix, *field, source);
      }
    } else if (IsChoiceOrArrayKind(type->extends) && type->constraints.elementType &&
               !TypeIdDefinition(*type->constraints.elementType)) {
      ReportRegistrationError(
          "$$$/ovrametadata/ErrorInArrayOrChoice/InvalidElementTypeInType=XMP type "
          "#{quot}@0#{quot} has an invalid element type #{quot}@1#{quot}.",
          {type->name, *type->constraints.elementType}, source);
    }
  }
  return true;
}

// --- Start-up tables

void AddCommonSchemaDefinition(SchemaDefinitionPtr const& schema) {
  sCommonSchemaDefinitions.push_back(schema);
}

void AddDynamicSchemaDefinition(SchemaDefinitionPtr const& schema) {
  sDynamicSchemaDefinitions.push_back(schema);
}

bool HasStandardSchemaNamespace(StandardSchema schema) {
  return sStandardSchemaNamespace.count(schema) > 0;
}

void SetStandardSchemaNamespace(StandardSchema schema, UTF8String const& namespaceURI) {
  sStandardSchemaNamespace[schema] = namespaceURI;
}

void ClearDefinitionsRegistry() {
  sDynamicSchemaDefinitions.clear();
  sCommonSchemaDefinitions.clear();
  sStandardSchemaNamespace.clear();
  sTypeDefinitions.clear();
  sSchemaDefinitions.clear();
  sSchemaToFilePath.clear();
  sTypeToFilePath.clear();
}

}  // namespace ovrametadata
