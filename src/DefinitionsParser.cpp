// Reading "xmp_definitions" documents, and the parse-and-register entry
// points.
#include "DefinitionsParser.h"

#include <forward_list>
#include <string_view>

#include <boost/make_shared.hpp>

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>

#include "InitializeInternal.h"

namespace ovrametadata {

using namespace std::string_view_literals;

const char* const kDefinitionsUINamespace = "http://ns.ovrametadata.org/xmp/propsheet/ui/";

namespace {

const char* const kInvalidXML = "$$$/ovrametadata/DefinitionsParser/InvalidXML=invalid XML.";

// The attributes this format knows, taken in one pass over the element's
// attributes (start-up parses every built-in file, so lookups one by one
// would dominate). The views point into the parser's attributes, valid for
// the current element only; an absent attribute reads as empty.
struct DefinitionAttributes {
  std::string_view namespaceURI, prefix, label, description, dynamic, name, type, extends,
      elementType, pattern, max, min, deprecated, category, rawValue, multiLine;
  bool hasDeprecated = false;
  // Values that needed decoding live here; a list, so that none moves.
  std::forward_list<UTF8String> decoded;
};

// Every value passes through the reserved-character decoding as well.
std::string_view Decoded(DefinitionAttributes& read, std::string_view value) {
  if (value.find('&') == std::string_view::npos) return value;
  read.decoded.push_front(ovracore::DecodeXMLReserved(value));
  return read.decoded.front();
}

UTF8String Decoded(std::string_view value) {
  return value.find('&') == std::string_view::npos ? UTF8String(value)
                                                   : ovracore::DecodeXMLReserved(value);
}

void ReadAttributes(const ovracore::Attributes& attributes, DefinitionAttributes& read) {
  for (const ovracore::Attributes::Entry& attribute : attributes.All()) {
    const std::string_view name = attribute.localName;
    const std::string_view value = attribute.value;
    if (!attribute.namespaceURI.empty()) {
      if (name == "multiLine"sv && attribute.namespaceURI == kDefinitionsUINamespace) {
        read.multiLine = Decoded(read, value);
      }
      continue;
    }
    std::string_view* target = nullptr;
    if (name == "namespace"sv) target = &read.namespaceURI;
    else if (name == "prefix"sv) target = &read.prefix;
    else if (name == "label"sv) target = &read.label;
    else if (name == "description"sv) target = &read.description;
    else if (name == "dynamic"sv) target = &read.dynamic;
    else if (name == "name"sv) target = &read.name;
    else if (name == "type"sv) target = &read.type;
    else if (name == "extends"sv) target = &read.extends;
    else if (name == "element_type"sv) target = &read.elementType;
    else if (name == "pattern"sv) target = &read.pattern;
    else if (name == "max"sv) target = &read.max;
    else if (name == "min"sv) target = &read.min;
    else if (name == "deprecated"sv) {
      target = &read.deprecated;
      read.hasDeprecated = true;
    }
    else if (name == "category"sv) target = &read.category;
    else if (name == "raw_value"sv) target = &read.rawValue;
    if (target) *target = Decoded(read, value);
  }
}

// Texts without a key, placeholder or escape come out of the localiser
// unchanged, so they skip it.
UTF16String Localized(std::string_view text, UTF16String const& asWritten) {
  if (text.compare(0, 4, "$$$/"sv) != 0 && text.find('#') == std::string_view::npos &&
      text.find('@') == std::string_view::npos) {
    return asWritten;
  }
  return ovracore::ZString(text);
}

void ReadLabelAndDescription(LocalizedDefinition& definition, DefinitionAttributes const& read) {
  definition.labelSource = ovracore::ToUTF16(read.label);
  definition.descriptionSource = ovracore::ToUTF16(read.description);
  definition.label = Localized(read.label, definition.labelSource);
  definition.description = Localized(read.description, definition.descriptionSource);
}

// The attributes shared by properties, fields, qualifiers and types, in
// the order the format defines.
void ReadEntryAttributes(EntryDefinition& entry, DefinitionAttributes const& read) {
  if (!read.type.empty()) entry.type = UTF8String(read.type);
  if (!read.name.empty()) entry.name = read.name;
  if (!read.extends.empty()) {
    entry.extends = PrimitiveTypeIdAsPrimitiveType(UTF8String(read.extends));
    if (!entry.extends) {
      // Reported without a source: the entry's file is not known here.
      SendError(kDefinitionParsingError,
                ovracore::ZString("$$$/ovrametadata/ParseEntryDefinition/InvalidExtendType=Entry "
                                  "must extend valid primitive type"),
                UTF16String());
    }
  }
  if (!read.elementType.empty()) entry.constraints.elementType = UTF8String(read.elementType);
  if (!read.pattern.empty()) entry.constraints.pattern = UTF8String(read.pattern);
  // A bound that is not a number is left out.
  if (!read.max.empty()) {
    if (const auto value = ovracore::ToDouble(read.max)) entry.constraints.max = *value;
  }
  if (!read.min.empty()) {
    if (const auto value = ovracore::ToDouble(read.min)) entry.constraints.min = *value;
  }
  if (read.hasDeprecated) entry.constraints.deprecated = read.deprecated == "true"sv;
  ReadLabelAndDescription(entry, read);
}

// Entries without a label show their name.
void ApplyLabelRule(EntryDefinition& entry, DefinitionAttributes const& read) {
  if (entry.label.empty()) entry.label = ovracore::ToUTF16(read.name);
}

}  // namespace

DefinitionsParser::DefinitionsParser(DefinitionsPair& result, UTF16String path)
    : mResult(result), filePath(std::move(path)) {}

void DefinitionsParser::Report(UTF16String const& message) {
  SendError(kDefinitionParsingError, message, filePath);
}

void DefinitionsParser::StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                                     const ovracore::Attributes& attributes) {
  if (namespaceURI.empty() && localName == "xmp_property"sv) {
    StartProperty(attributes);
  } else if (namespaceURI == kDefinitionsUINamespace) {
    if (localName == "separator"sv) StartSeparator(attributes);
  } else {
    AbstractParseHandler::StartElement(namespaceURI, localName, attributes);
  }
}

void DefinitionsParser::StartElementNoNamespace(const UTF8String& name,
                                                const ovracore::Attributes& attributes) {
  if (name == "xmp_schema"sv) {
    StartSchema(attributes);
  } else if (name == "xmp_type"sv) {
    StartType(attributes);
  } else if (name == "xmp_field"sv) {
    StartField(attributes);
  } else if (name == "xmp_choice"sv) {
    StartChoice(attributes);
  } else if (name == "xmp_qualifier"sv) {
    StartQualifier(attributes);
  } else if (name != "xmp_definitions"sv) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidDefinitionsTag=invalid definitions tag "
        "#{quot}@0#{quot}.",
        {name}));
  }
}

void DefinitionsParser::StartSchema(const ovracore::Attributes& attributes) {
  DefinitionAttributes read;
  ReadAttributes(attributes, read);
  auto schema = boost::make_shared<SchemaDefinition>();
  schema->namespaceURI = read.namespaceURI;
  schema->prefix = read.prefix;
  ReadLabelAndDescription(*schema, read);
  schema->isDynamic = read.dynamic == "true"sv;
  if (schema->label.empty()) schema->label = ovracore::ToUTF16(schema->prefix);
  currentProperties = &schema->properties;
  mResult.first.push_back(schema);
}

void DefinitionsParser::StartType(const ovracore::Attributes& attributes) {
  DefinitionAttributes read;
  ReadAttributes(attributes, read);
  auto type = boost::make_shared<TypeDefinition>();
  ReadEntryAttributes(*type, read);
  ApplyLabelRule(*type, read);
  currentFields = &type->fields;
  currentChoices = &type->constraints.choices;
  currentQualifiers = &type->constraints.qualifiers;
  mResult.second.push_back(type);
}

void DefinitionsParser::StartField(const ovracore::Attributes& attributes) {
  DefinitionAttributes read;
  ReadAttributes(attributes, read);
  if (!currentFields) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidFieldTag=invalid field tag #{quot}@0#{quot}.",
        {read.name}));
    return;
  }
  auto field = boost::make_shared<FieldDefinition>();
  field->namespaceURI = read.namespaceURI;
  field->prefix = read.prefix;
  ReadEntryAttributes(*field, read);
  ApplyLabelRule(*field, read);
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
  DefinitionAttributes read;
  ReadAttributes(attributes, read);
  auto choice = boost::make_shared<ChoiceDefinition>();
  choice->rawValue = read.rawValue;
  choice->labelSource = ovracore::ToUTF16(read.label);
  choice->label = Localized(read.label, choice->labelSource);
  if (choice->label.empty()) choice->label = ovracore::ToUTF16(choice->rawValue);
  currentChoices->push_back(choice);
}

void DefinitionsParser::StartQualifier(const ovracore::Attributes& attributes) {
  if (!currentQualifiers) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/DefinitionsParser/InvalidQualifierTag=invalid qualifier tag."));
    return;
  }
  DefinitionAttributes read;
  ReadAttributes(attributes, read);
  auto qualifier = boost::make_shared<QualifierDefinition>();
  qualifier->namespaceURI = read.namespaceURI;
  qualifier->prefix = read.prefix;
  ReadEntryAttributes(*qualifier, read);
  ApplyLabelRule(*qualifier, read);
  // The qualifier list stays current: following qualifiers are siblings.
  currentChoices = &qualifier->constraints.choices;
  currentQualifiers->push_back(qualifier);
}

void DefinitionsParser::StartProperty(const ovracore::Attributes& attributes) {
  DefinitionAttributes read;
  ReadAttributes(attributes, read);
  if (!currentProperties) {
    ReportInvalidProperty(UTF8String(read.name));
    return;
  }
  auto property = boost::make_shared<PropertyDefinition>();
  property->isInternal = read.category == "internal"sv;
  ReadEntryAttributes(*property, read);
  ApplyLabelRule(*property, read);
  if (read.multiLine == "true"sv) property->uiHints = PropertyUIHints{false, true};
  currentProperties->push_back(property);
  currentChoices = &property->constraints.choices;
  currentQualifiers = &property->constraints.qualifiers;
}

void DefinitionsParser::StartSeparator(const ovracore::Attributes& attributes) {
  if (!currentProperties) {
    ReportInvalidProperty(Decoded(attributes.Get("name")));
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

void DefinitionsParser::ReportInvalidProperty(UTF8String const& name) {
  Report(ovracore::ZString(
      "$$$/ovrametadata/DefinitionsParser/InvalidPropertyTag=invalid property tag "
      "#{quot}@0#{quot}.",
      {name}));
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
