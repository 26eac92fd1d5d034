// Definitions files written back: the mirror of the parser for everything
// it writes, with labels and descriptions as written (localisation keys).
#include <algorithm>
#include <charconv>

#include <ovrametadata/Definitions.h>

#include "InitializeInternal.h"
#include "XMLTextWriter.h"

namespace ovrametadata {

namespace {

// The shortest text that reads back as the same double.
UTF8String NumberText(double value) {
  char buffer[64];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  return UTF8String(buffer, result.ptr);
}

// As written when the file had a text, else the text the entry holds.
const UTF16String& Text(const UTF16String& source, const UTF16String& localized) {
  return source.empty() ? localized : source;
}

void Texts(XMLTextWriter& out, const LocalizedDefinition& definition) {
  out.Attribute("label", Text(definition.labelSource, definition.label));
  out.Attribute("description", Text(definition.descriptionSource, definition.description));
}

void EntryAttributes(XMLTextWriter& out, const EntryDefinition& entry) {
  const EntryConstraints& constraints = entry.constraints;
  out.Attribute("name", entry.name);
  if (entry.type) out.Attribute("type", *entry.type);
  if (entry.extends) out.Attribute("extends", PrimitiveTypeAsPrimitiveTypeId(*entry.extends));
  Texts(out, entry);
  if (constraints.elementType) out.Attribute("element_type", *constraints.elementType);
  if (constraints.pattern) out.Attribute("pattern", *constraints.pattern);
  if (constraints.max) out.Attribute("max", NumberText(*constraints.max));
  if (constraints.min) out.Attribute("min", NumberText(*constraints.min));
  if (constraints.deprecated && *constraints.deprecated) out.Attribute("deprecated", "true");
}

// The rest of an entry whose opening tag and leading attributes are out.
void EntryFragment(XMLTextWriter& out, const EntryDefinition& entry, const char* tag, int level) {
  const EntryConstraints& constraints = entry.constraints;
  EntryAttributes(out, entry);
  if (constraints.choices.empty() && constraints.qualifiers.empty()) {
    out.EndEmpty();
    return;
  }
  // A choice list always reads back with an element type.
  if (!constraints.choices.empty() && !constraints.elementType) out.Attribute("element_type", "text");
  out.EndOpen();
  for (const auto& choice : constraints.choices) {
    if (!choice) continue;
    out.Open(level + 1, "xmp_choice");
    out.Attribute("raw_value", choice->rawValue);
    out.Attribute("label", Text(choice->labelSource, choice->label));
    out.EndEmpty();
  }
  for (const auto& qualifier : constraints.qualifiers) {
    if (!qualifier) continue;
    out.Open(level + 1, "xmp_qualifier");
    out.Attribute("namespace", qualifier->namespaceURI);
    out.Attribute("prefix", qualifier->prefix);
    EntryFragment(out, *qualifier, "xmp_qualifier", level + 1);
  }
  out.Close(level, tag);
}

void WriteSchema(XMLTextWriter& out, const SchemaDefinition& schema, int level) {
  out.Open(level, "xmp_schema");
  out.Attribute("namespace", schema.namespaceURI);
  out.Attribute("prefix", schema.prefix);
  Texts(out, schema);
  out.EndOpen();
  for (const auto& property : schema.properties) {
    // Nameless entries stand for separators of generic panels, which this
    // format carries only as hints of the property before them.
    if (!property || property->name.empty()) continue;
    out.Open(level + 1, "xmp_property");
    out.Attribute("category", property->isInternal ? "internal" : "external");
    EntryFragment(out, *property, "xmp_property", level + 1);
  }
  out.Close(level, "xmp_schema");
}

void WriteType(XMLTextWriter& out, const TypeDefinition& type, int level) {
  out.Open(level, "xmp_type");
  if (type.fields.empty()) {
    EntryFragment(out, type, "xmp_type", level);
    return;
  }
  EntryAttributes(out, type);
  out.EndOpen();
  for (const auto& field : type.fields) {
    if (!field) continue;
    out.Open(level + 1, "xmp_field");
    out.Attribute("namespace", field->namespaceURI);
    out.Attribute("prefix", field->prefix);
    EntryFragment(out, *field, "xmp_field", level + 1);
  }
  out.Close(level, "xmp_type");
}

}  // namespace

UTF8String WriteDefinitionsToBuffer(Range<SchemaDefinitionPtr> schemas, Range<TypeDefinitionPtr> types) {
  XMLTextWriter out;
  out.Open(0, "xmp_definitions");
  out.EndOpen();
  for (const SchemaDefinitionPtr& schema : schemas)
    if (schema) WriteSchema(out, *schema, 1);
  for (const TypeDefinitionPtr& type : types)
    if (type) WriteType(out, *type, 1);
  out.Close(0, "xmp_definitions");
  return out.Text();
}

bool WriteSchemaFile(DefinitionsPair const& definitions, UTF16String const& path) {
  // A failed write never leaves half a definitions file.
  return StoreText(path, WriteDefinitionsToBuffer(Range<SchemaDefinitionPtr>(definitions.first),
                                              Range<TypeDefinitionPtr>(definitions.second)));
}

void RewriteSchemaFile(SchemaDefinitionPtr schema) {
  const UTF16String path = filePathForSchema(schema);
  if (path.empty()) return;
  // The file's schemas in the order they were loaded, which is its order.
  std::vector<SchemaDefinitionPtr> loaded;
  for (const auto& range : {CommonSchemaDefinitions(), DynamicSchemaDefinitions()})
    for (const SchemaDefinitionPtr& registered : range) loaded.push_back(registered);
  std::vector<SchemaDefinitionPtr> schemas = allSchemasFromSourceFile(path);
  const auto position = [&](const SchemaDefinitionPtr& s) {
    return std::find(loaded.begin(), loaded.end(), s) - loaded.begin();
  };
  std::stable_sort(schemas.begin(), schemas.end(),
                   [&](const SchemaDefinitionPtr& a, const SchemaDefinitionPtr& b) { return position(a) < position(b); });
  WriteSchemaFile({schemas, allTypesFromSourceFile(path)}, path);
}

}  // namespace ovrametadata
