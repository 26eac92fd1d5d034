// Not part of the interface: the reader of view definitions files and the
// view registry's shutdown.
#pragma once

#include <deque>
#include <map>
#include <vector>

#include <ovracore/SAXParser.h>
#include <ovrametadata/Views.h>

namespace ovrametadata {

class XMLTextWriter;

// The namespace of view definitions files.
extern const char* const kViewsUINamespace;

// Empties the registered views and lets the next start-up load them again.
void ClearViewDefinitions();
void ResetViewLoadCount();

// Reads one view definitions file. Every problem is reported with the
// source as context and reading goes on where it can; a view is handed out
// once its end tag has been read.
class ViewDefinitionsHandler : public ovracore::AbstractParseHandler {
 public:
  enum State : std::int32_t {
    kBeforeRoot = 0,
    kAfterRoot = 1,
    kInViews = 2,
    kInView = 3,
    kSkipping = 4,
    kInItem = 5,
    kInNestedItem = 6,
    kInParam = 7,
    kInChoice = 8,
    kFailed = 9
  };

  explicit ViewDefinitionsHandler(UTF16String source);

  void StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                    const ovracore::Attributes& attributes) override;
  void EndElement(const UTF8String& namespaceURI, const UTF8String& localName) override;
  void StartPrefixMapping(const UTF8String& prefix, const UTF8String& namespaceURI) override;
  void EndPrefixMapping(const UTF8String& prefix) override;

  State CurrentState() const { return state; }
  const std::vector<ViewDefinitionPtr>& Views() const { return views; }

  // "prefix:name" to namespace URI and local name, through the prefixes the
  // file declares; false when it cannot be (reported where a user erred).
  bool ResolveQualifiedName(const UTF8String& value, UTF8String& namespaceURI,
                            UTF8String& localName);
  // "prefix:property" or "prefix:struct/prefix:field" to the path of a
  // registered definition; the empty path (reported) when there is none.
  Path PathForQualifiedName(const UTF8String& value);

 private:
  struct ElementName {
    UTF8String name;    // "item" for every item element
    UTF8String widget;  // the widget an item element stands for
    bool isProperty = false;
  };
  static ElementName ResolveItemAlternatives(const UTF8String& localName);
  void HandleItem(const UTF8String& elementWidget, const ovracore::Attributes& attributes);
  void StartView(const ovracore::Attributes& attributes);
  void StartInItem(const ElementName& element, const ovracore::Attributes& attributes);
  void Report(const UTF16String& message);

  State state = kBeforeRoot;
  std::vector<ViewDefinitionPtr> views;
  std::deque<ViewItemPtr> itemStack;
  ViewDefinitionPtr currentView;
  ViewItemPtr currentItem;
  // Each prefix's declarations, innermost last, so that the end of an inner
  // declaration brings the outer one back.
  std::map<UTF8String, std::vector<UTF8String>, std::less<>> prefixMap;
  bool nameRequired = false;
  UTF16String source;
};

// The view writer's steps. The first property of the base schemas that has
// the name of property and differs from it (internal mark, texts), or null.
PropertyDefinitionPtr CompareProperties(const PropertyDefinition& property,
                                        const std::vector<SchemaDefinitionPtr>& baseSchemas);
// One "property" element (or a separator) at level.
void AddPropertyItem(const PropertyDefinitionPtr& property, const UTF8String& namespaceURI, XMLTextWriter& out,
                     const ViewDefinitionWriterInfo& info, int level);
// Every property of schema, one level below level.
void AddPropertyItems(const SchemaDefinition& schema, XMLTextWriter& out, const ViewDefinitionWriterInfo& info,
                      int level);

}  // namespace ovrametadata
