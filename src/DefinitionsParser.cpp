// Reading "xmp_definitions" documents, and the parse-and-register entry
// points.
#include "DefinitionsParser.h"

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>

#include "InitializeInternal.h"

namespace ovrametadata {

const char* const kDefinitionsUINamespace = "http://ns.ovrametadata.org/xmp/propsheet/ui/";

namespace {

const char* const kInvalidXML = "$$$/ovrametadata/DefinitionsParser/InvalidXML=invalid XML.";

// An absent attribute reads as the empty string.
UTF8String Attribute(const ovracore::Attributes& attributes, std::string_view name,
                     std::string_view namespaceURI = {}) {
  return ovracore::DecodeXMLReserved(attributes.Get(name, namespaceURI));
}

void ReadLabelAndDescription(LocalizedDefinition& definition,
                             const ovracore::Attributes& attributes) {
  const UTF8String label = Attribute(attributes, "label");
  const UTF8String description = Attribute(attributes, "description");
  definition.labelSource = ovracore::ToUTF16(label);
  definition.descriptionSource = ovracore::ToUTF16(description);
  definition.label = ovracore::ZString(label);
  definition.description = ovracore::ZString(description);
}

// Entries without a label show their name.
void ApplyLabelRule(EntryDefinition& entry, const ovracore::Attributes& attributes) {
  if (entry.label.empty()) entry.label = ovracore::ToUTF16(Attribute(attributes, "name"));
}

}  // namespace

DefinitionsParser::DefinitionsParser(DefinitionsPair& result, UTF16String path)
    : mResult(result), filePath(std::move(path)) {}

void DefinitionsParser::Report(UTF16String const& message) {
  SendError(kDefinitionParsingError, message, filePath);
}

void DefinitionsParser::StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                                     const ovracore::Attributes& attributes) {
  if (namespaceURI.empty() && localName == "xmp_property") {
    StartProperty(attributes);
  } else if (namespaceURI == kDefinitionsUINamespace) {
    if (localName == "separator") StartSeparator(attributes);
  } else {
    AbstractParseHandler::StartElement(namespaceURI, localName, attributes);
  }
}

void DefinitionsParser::StartElementNoNamespace(const UTF8String& name,
                                                const ovracore::Attributes& attributes) {
  if (name == "xmp_schema") {
    StartSchema(attributes);
  } else if (name == "xmp_type") {
    StartType(attributes);
  } else if (name == "xmp_field") {
    StartField(attributes);
  } else if (name == "xmp_choice") {
    StartChoice(attributes);
  } else if (name == "xmp_qualifier") {
    StartQualifier(attributes);
  } else if (name != "xmp_definitions") {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidDefinitionsTag=invalid definitions tag "
        "#{quot}@0#{quot}.",
        {name}));
  }
}

void DefinitionsParser::StartSchema(const ovracore::Attributes& attributes) {
  auto schema = boost::shared_ptr<SchemaDefinition>(new SchemaDefinition);
  schema->namespaceURI = Attribute(attributes, "namespace");
  schema->prefix = Attribute(attributes, "prefix");
  ReadLabelAndDescription(*schema, attributes);
  schema->isDynamic = Attribute(attributes, "dynamic") == "true";
  if (schema->label.empty()) schema->label = ovracore::ToUTF16(schema->prefix);
  currentProperties = &schema->properties;
  mResult.first.push_back(schema);
}

void DefinitionsParser::StartType(const ovracore::Attributes& attributes) {
  auto type = boost::shared_ptr<TypeDefinition>(new TypeDefinition);
  ReadEntryAttributes(*type, attributes);
  ApplyLabelRule(*type, attributes);
  currentFields = &type->fields;
  currentChoices = &type->constraints.choices;
  currentQualifiers = &type->constraints.qualifiers;
  mResult.second.push_back(type);
}

void DefinitionsParser::StartField(const ovracore::Attributes& attributes) {
  if (!currentFields) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidFieldTag=invalid field tag #{quot}@0#{quot}.",
        {Attribute(attributes, "name")}));
    return;
  }
  auto field = boost::shared_ptr<FieldDefinition>(new FieldDefinition);
  field->namespaceURI = Attribute(attributes, "namespace");
  field->prefix = Attribute(attributes, "prefix");
  ReadEntryAttributes(*field, attributes);
  ApplyLabelRule(*field, attributes);
  currentChoices = &field->constraints.choices;
  currentQualifiers = &field->constraints.qualifiers;
  currentFields->push_back(field);
}

void DefinitionsParser::StartChoice(const ovracore::Attributes& attributes) {
  if (!currentChoices) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidChoiceTag=invalid choice tag."));
    return;
  }
  auto choice = boost::shared_ptr<ChoiceDefinition>(new ChoiceDefinition);
  choice->rawValue = Attribute(attributes, "raw_value");
  const UTF8String label = Attribute(attributes, "label");
  choice->labelSource = ovracore::ToUTF16(label);
  choice->label = ovracore::ZString(label);
  if (choice->label.empty()) choice->label = ovracore::ToUTF16(choice->rawValue);
  currentChoices->push_back(choice);
}

void DefinitionsParser::StartQualifier(const ovracore::Attributes& attributes) {
  if (!currentQualifiers) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidQualifierTag=invalid qualifier tag."));
    return;
  }
  auto qualifier = boost::shared_ptr<QualifierDefinition>(new QualifierDefinition);
  qualifier->namespaceURI = Attribute(attributes, "namespace");
  qualifier->prefix = Attribute(attributes, "prefix");
  ReadEntryAttributes(*qualifier, attributes);
  ApplyLabelRule(*qualifier, attributes);
  // The qualifier list stays current: following qualifiers are siblings.
  currentChoices = &qualifier->constraints.choices;
  currentQualifiers->push_back(qualifier);
}

void DefinitionsParser::StartProperty(const ovracore::Attributes& attributes) {
  if (!currentProperties) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidPropertyTag=invalid property tag "
        "#{quot}@0#{quot}.",
        {Attribute(attributes, "name")}));
    return;
  }
  auto property = boost::shared_ptr<PropertyDefinition>(new PropertyDefinition);
  property->isInternal = Attribute(attributes, "category") == "internal";
  ReadEntryAttributes(*property, attributes);
  ApplyLabelRule(*property, attributes);
  if (Attribute(attributes, "multiLine", kDefinitionsUINamespace) == "true") {
    property->uiHints = PropertyUIHints{false, true};
  }
  currentProperties->push_back(property);
  currentChoices = &property->constraints.choices;
  currentQualifiers = &property->constraints.qualifiers;
}

void DefinitionsParser::StartSeparator(const ovracore::Attributes& attributes) {
  if (!currentProperties) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidPropertyTag=invalid property tag "
        "#{quot}@0#{quot}.",
        {Attribute(attributes, "name")}));
    return;
  }
  if (currentProperties->empty()) return;
  auto& hints = currentProperties->back()->uiHints;
  if (hints) {
    hints->separatorAfter = true;
  } else {
    hints = PropertyUIHints{true, false};
  }
}

void DefinitionsParser::ReadEntryAttributes(EntryDefinition& entry,
                                            const ovracore::Attributes& attributes) {
  const UTF8String type = Attribute(attributes, "type");
  if (!type.empty()) entry.type = type;
  const UTF8String name = Attribute(attributes, "name");
  if (!name.empty()) entry.name = name;
  const UTF8String extends = Attribute(attributes, "extends");
  if (!extends.empty()) {
    entry.extends = PrimitiveTypeIdAsPrimitiveType(extends);
    if (!entry.extends) {
      // Reported without a source, as the message names no file.
      SendError(kDefinitionParsingError,
                ovracore::ZString("$$$/ovrametadata/ParseEntryDefinition/InvalidExtendType=Entry "
                                  "must extend valid primitive type"),
                UTF16String());
    }
  }
  const UTF8String elementType = Attribute(attributes, "element_type");
  if (!elementType.empty()) entry.constraints.elementType = elementType;
  const UTF8String pattern = Attribute(attributes, "pattern");
  if (!pattern.empty()) entry.constraints.pattern = pattern;
  // A bound that is not a number is left out.
  const UTF8String max = Attribute(attributes, "max");
  if (!max.empty()) {
    if (const auto value = ovracore::ToDouble(max)) entry.constraints.max = *value;
  }
  const UTF8String min = Attribute(attributes, "min");
  if (!min.empty()) {
    if (const auto value = ovracore::ToDouble(min)) entry.constraints.min = *value;
  }
  if (attributes.Has("deprecated")) {
    entry.constraints.deprecated = Attribute(attributes, "deprecated") == "true";
  }
  ReadLabelAndDescription(entry, attributes);
}

// --- Entry points

namespace {

// Runs one parse; false when the XML parser gives up (what was read before
// stays in result).
template <class Run>
bool Parse(DefinitionsPair& result, UTF16String const& source, Run run) {
  DefinitionsParser handler(result, source);
  try {
    auto parser = ovracore::GetParserWithNamespaceSupport(handler);
    return run(*parser);
  } catch (...) {
    // Only resource exhaustion gets here; treat it as an unreadable document.
    return false;
  }
}

DefinitionsPair Register(DefinitionsPair pair, UTF16String const& source,
                         bool mergeIntoExisting) {
  // Types first, so that properties may refer to the file's own types.
  if (RegisterTypeDefinitions(pair.second, source)) {
    CheckFieldTypes(pair.second, source);
  } else {
    pair.second.clear();
  }
  if (RegisterSchemaDefinitions(pair.first, source, mergeIntoExisting)) {
    CheckPropertyTypes(pair.first, source);
  } else {
    pair.first.clear();
  }
  return pair;
}

}  // namespace

DefinitionsPair ParseBufferForDefinitions(UTF8String const& buffer,
                                          UTF16String const& sourceName) {
  DefinitionsPair result;
  const bool parsed = Parse(result, sourceName, [&](ovracore::Parser& parser) {
    return parser.ParseBuffer(buffer.data(), buffer.size());
  });
  if (!parsed) SendError(kDefinitionParsingError, ovracore::ZString(kInvalidXML), sourceName);
  return result;
}

bool ParseDocumentForDefinitions(UTF16String const& path, DefinitionsPair& result) {
  const bool parsed =
      Parse(result, path, [&](ovracore::Parser& parser) { return parser.ParseFile(path); });
  if (!parsed) SendError(kDefinitionParsingError, ovracore::ZString(kInvalidXML), path);
  return parsed;
}

DefinitionsPair ParseDocumentForDefinitions(UTF16String const& path) {
  DefinitionsPair result;
  ParseDocumentForDefinitions(path, result);
  return result;
}

DefinitionsPair ParseBufferAndRegisterDefinitions(UTF8String const& buffer,
                                                  UTF16String const& sourceName,
                                                  bool mergeIntoExisting) {
  return Register(ParseBufferForDefinitions(buffer, sourceName), sourceName, mergeIntoExisting);
}

DefinitionsPair ParseDocumentAndRegisterDefinitions(UTF16String const& path,
                                                    bool mergeIntoExisting) {
  return Register(ParseDocumentForDefinitions(path), path, mergeIntoExisting);
}

}  // namespace ovrametadata
