// View definitions files written from schemas: one view showing every
// property, which overrides only what differs from the registered
// definitions, so that a panel falls back to the definitions' texts.
#include <map>

#include <ovrametadata/Views.h>

#include "InitializeInternal.h"
#include "XMLTextWriter.h"
#include "views/ViewsInternal.h"

namespace ovrametadata {

namespace {

struct Flags {
  bool labelDiffers = false;
  bool descriptionDiffers = false;
  bool readOnly = false;
  bool dropdown = false;
};

// The registered definition a property of a registered namespace is
// compared with: the property of that name, or for "Struct/prefix:Field"
// that field of the structure's type.
boost::shared_ptr<EntryDefinition> RegisteredBase(const SchemaDefinitionPtr& schema, const UTF8String& name) {
  const std::size_t slash = name.find('/');
  if (slash == UTF8String::npos) return PropertyNameDefinition(schema, name);
  const PropertyDefinitionPtr structure = PropertyNameDefinition(schema, name.substr(0, slash));
  if (!structure || !structure->type) return {};
  const std::size_t colon = name.find(':', slash);
  return FieldNameDefinition(TypeIdDefinition(*structure->type),
                             colon == UTF8String::npos ? name.substr(slash + 1) : name.substr(colon + 1));
}

Flags DecideFlags(const PropertyDefinition& property, const UTF8String& namespaceURI,
                  const ViewDefinitionWriterInfo& info) {
  Flags flags;
  if (const SchemaDefinitionPtr schema = NamespaceDefinition(namespaceURI)) {
    const boost::shared_ptr<EntryDefinition> base = RegisteredBase(schema, property.name);
    if (!base) return flags;
    flags.labelDiffers = property.labelSource != base->labelSource;
    flags.descriptionDiffers = property.descriptionSource != base->descriptionSource;
    // A simple property of the definitions offered as a choice of values.
    const auto& elementType = property.constraints.elementType;
    flags.dropdown = property.type != base->type && elementType && base->type == *elementType &&
                     property.type && (*property.type == "openchoice" || *property.type == "closedchoice");
    return flags;
  }
  if (const PropertyDefinitionPtr base = CompareProperties(property, info.baseSchemas)) {
    flags.labelDiffers = property.labelSource != base->labelSource;
    flags.descriptionDiffers = property.descriptionSource != base->descriptionSource;
    flags.readOnly = property.isInternal && !base->isInternal;
  }
  return flags;
}

}  // namespace

PropertyDefinitionPtr CompareProperties(const PropertyDefinition& property,
                                        const std::vector<SchemaDefinitionPtr>& baseSchemas) {
  for (const SchemaDefinitionPtr& schema : baseSchemas) {
    if (!schema) continue;
    for (const PropertyDefinitionPtr& base : schema->properties) {
      if (!base || base->name != property.name) continue;
      if (base->isInternal != property.isInternal || base->labelSource != property.labelSource ||
          base->descriptionSource != property.descriptionSource)
        return base;
    }
  }
  return {};
}

void AddPropertyItem(const PropertyDefinitionPtr& property, const UTF8String& namespaceURI, XMLTextWriter& out,
                     const ViewDefinitionWriterInfo& info, int level) {
  if (!property) return;
  const bool separatorAfter = property->uiHints && property->uiHints->separatorAfter;
  // A nameless entry with hints stands for a separator of its own.
  if (property->uiHints && property->name.empty()) {
    if (separatorAfter) out.Line(level, "<separator/>");
    return;
  }
  const Flags flags = DecideFlags(*property, namespaceURI, info);
  out.Open(level, "property");
  out.Attribute("name", info.currentPrefix + ":" + property->name);
  if (flags.readOnly) out.Attribute("readOnly", "true");
  if (flags.labelDiffers) out.Attribute("label", property->labelSource);
  if (flags.descriptionDiffers) out.Attribute("description", property->descriptionSource);
  if (flags.dropdown) {
    out.Attribute("widget", "dropdown");
    if (*property->type == "openchoice") out.Attribute("openChoice", "true");
  }
  if (property->uiHints && property->uiHints->multiLine) out.Attribute("multiLines", "3");
  const auto& choices = property->constraints.choices;
  if (flags.dropdown && !choices.empty()) {
    out.EndOpen();
    for (const auto& choice : choices) {
      if (!choice) continue;
      out.Open(level + 1, "choice");
      out.Attribute("label", choice->labelSource);
      out.Attribute("value", choice->rawValue);
      out.EndEmpty();
    }
    out.Close(level, "property");
  } else {
    out.EndEmpty();
  }
  if (separatorAfter) out.Line(level, "<separator/>");
}

void AddPropertyItems(const SchemaDefinition& schema, XMLTextWriter& out, const ViewDefinitionWriterInfo& info,
                      int level) {
  for (const PropertyDefinitionPtr& property : schema.properties)
    AddPropertyItem(property, schema.namespaceURI, out, info, level + 1);
}

bool WriteViewDefinitionsFileFromSchema(const std::vector<SchemaDefinitionPtr>& schemas,
                                        const std::vector<SchemaDefinitionPtr>& baseSchemas,
                                        const GenericPanelManifestParser::ManifestInfo& manifest,
                                        const UTF16String& path) {
  ViewDefinitionWriterInfo info;
  info.viewName = manifest.name;
  info.viewLabel = manifest.label;
  info.viewDescription = manifest.description;
  info.localizationFile = manifest.localizationFile;
  info.baseSchemas = baseSchemas;

  XMLTextWriter out;
  if (!schemas.empty()) {
    out.Open(0, "views");
    out.Attribute("xmlns", kViewsUINamespace);
    out.EndOpen();
    out.Open(1, "view");
    std::map<UTF8String, UTF8String> prefixes;
    for (const SchemaDefinitionPtr& schema : schemas)
      if (schema) prefixes.emplace(schema->prefix, schema->namespaceURI);
    for (const auto& [prefix, uri] : prefixes) out.Attribute("xmlns:" + prefix, uri);
    out.Attribute("name", info.viewName);
    out.Attribute("label", info.viewLabel);
    out.Attribute("description", info.viewDescription);
    out.EndOpen();
    for (const SchemaDefinitionPtr& schemaPtr : schemas) {
      if (!schemaPtr) continue;
      const SchemaDefinition schema = *schemaPtr;
      info.currentPrefix = schema.prefix;
      info.currentSectionLabel = schema.labelSource;
      info.currentSectionDescription = schema.descriptionSource;
      if (schema.labelSource.empty()) {
        AddPropertyItems(schema, out, info, 1);
        continue;
      }
      out.Open(2, "section");
      out.Attribute("label", schema.labelSource);
      out.EndOpen();
      AddPropertyItems(schema, out, info, 2);
      out.Close(2, "section");
    }
    out.Close(1, "view");
    out.Close(0, "views");
  }
  // Never half a view file.
  return StoreText(path, out.Text());
}

}  // namespace ovrametadata
