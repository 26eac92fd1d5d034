// Not part of the interface: the SAX handler that reads "xmp_definitions"
// documents into a DefinitionsPair.
#pragma once

#include <vector>

#include <ovracore/SAXParser.h>
#include <ovrametadata/Definitions.h>

namespace ovrametadata {

// The namespace of the presentation hints inside definitions files.
extern const char* const kDefinitionsUINamespace;

// Deliberately without end-element handling: a schema, type or entry stays
// current until the next element of its kind replaces it, so nesting is
// recognised by document order. Files that close a schema and then list
// further properties rely on this.
class DefinitionsParser : public ovracore::AbstractParseHandler {
 public:
  DefinitionsParser(DefinitionsPair& result, UTF16String filePath);

  void StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                    const ovracore::Attributes& attributes) override;
  void StartElementNoNamespace(const UTF8String& name,
                               const ovracore::Attributes& attributes) override;

 private:
  void StartSchema(const ovracore::Attributes& attributes);
  void StartType(const ovracore::Attributes& attributes);
  void StartField(const ovracore::Attributes& attributes);
  void StartChoice(const ovracore::Attributes& attributes);
  void StartQualifier(const ovracore::Attributes& attributes);
  void StartProperty(const ovracore::Attributes& attributes);
  void StartSeparator(const ovracore::Attributes& attributes);
  void ReportInvalidProperty(UTF8String const& name);
  void Report(UTF16String const& message);

  DefinitionsPair& mResult;
  std::vector<boost::shared_ptr<PropertyDefinition>>* currentProperties = nullptr;
  std::vector<boost::shared_ptr<FieldDefinition>>* currentFields = nullptr;
  std::vector<boost::shared_ptr<ChoiceDefinition>>* currentChoices = nullptr;
  std::vector<boost::shared_ptr<QualifierDefinition>>* currentQualifiers = nullptr;
  UTF16String filePath;
};

}  // namespace ovrametadata
