// View definitions files: the handler that reads them, the resolution of the
// property names they use, and the loading of every view at start-up.
#include <functional>
#include <memory>
#include <string_view>
#include <utility>

#include <boost/algorithm/string/predicate.hpp>
#include <boost/make_shared.hpp>

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>

#include "InitializeInternal.h"
#include "extensions/ExtensionsInternal.h"
#include "views/ViewsInternal.h"

namespace ovrametadata {

using namespace std::string_view_literals;

const char* const kViewsUINamespace = "http://ns.ovrametadata.org/metadata/ui/1.0/";

namespace {

const char* const kInvalidXML = "$$$/ovrametadata/view_parser/InvalidXML=invalid XML.";
const char* const kNoViewsTag = "$$$/ovrametadata/view_parser/NoViewsTag=outermost Tag has to be <views/>.";
const char* const kInvalidPrefix =
    "$$$/ovrametadata/view_parser/InvalidPrefixInXMPProperty=invalid prefix in XMP property #{quot}@0#{quot}.";

// Start-up calls are counted; only the first loads.
unsigned sLoadCount = 0;

// Splits at runs of one separator; the parts between runs may be empty only
// at either end. Views of text, which outlives them.
std::vector<std::string_view> SplitAtRuns(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  std::size_t start = 0;
  while (true) {
    const std::size_t end = text.find(separator, start);
    parts.push_back(text.substr(start, end == std::string_view::npos ? std::string_view::npos : end - start));
    if (end == std::string_view::npos) return parts;
    start = text.find_first_not_of(separator, end);
    if (start == std::string_view::npos) {
      parts.emplace_back();
      return parts;
    }
  }
}

std::vector<ViewDefinitionPtr> Parse(const UTF16String& source,
                                     const std::function<bool(ovracore::Parser&)>& parse) {
  ViewDefinitionsHandler handler(source);
  const std::unique_ptr<ovracore::Parser> parser = ovracore::GetParserWithNamespaceSupport(handler);
  if (!parse(*parser)) SendError(kViewDefinitionParsingError, ovracore::ZString(kInvalidXML), source);
  return handler.Views();
}

}  // namespace

ViewDefinitionsHandler::ViewDefinitionsHandler(UTF16String source) : source(std::move(source)) {}

void ViewDefinitionsHandler::Report(const UTF16String& message) {
  SendError(kViewDefinitionParsingError, message, source);
}

ViewDefinitionsHandler::ElementName ViewDefinitionsHandler::ResolveItemAlternatives(
    const UTF8String& localName) {
  if (localName == "property"sv) return {"item", {}, true};
  for (const char* widget : {"separator", "note", "section", "formatter"})
    if (localName == widget) return {"item", widget, false};
  return {localName, {}, false};
}

void ViewDefinitionsHandler::StartPrefixMapping(const UTF8String& prefix, const UTF8String& namespaceURI) {
  prefixMap[prefix].push_back(namespaceURI);
}

void ViewDefinitionsHandler::EndPrefixMapping(const UTF8String& prefix) {
  const auto found = prefixMap.find(prefix);
  if (found == prefixMap.end()) return;
  found->second.pop_back();
  if (found->second.empty()) prefixMap.erase(found);
}

void ViewDefinitionsHandler::StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                                          const ovracore::Attributes& attributes) {
  if (namespaceURI != kViewsUINamespace) {
    if (localName == "views"sv) {
      state = kSkipping;
      Report(ovracore::ZString(
          "$$$/ovrametadata/view_parser/MissingUINameSpace=missing namespace #{quot}@0#{quot}, views in the "
          "file will be skipped.",
          {kViewsUINamespace}));
    } else if (state == kBeforeRoot) {
      state = kFailed;
      Report(ovracore::ZString(kNoViewsTag));
    }
    return;
  }
  switch (state) {
    case kBeforeRoot:
      if (localName == "views"sv) {
        state = kInViews;
      } else {
        state = kFailed;
        Report(ovracore::ZString(kNoViewsTag));
      }
      return;
    case kAfterRoot:
    case kSkipping:
    case kInParam:
    case kInChoice:
    case kFailed:
      return;
    case kInViews:
      if (localName == "view"sv) StartView(attributes);
      return;
    case kInView: {
      const ElementName element = ResolveItemAlternatives(localName);
      if (element.name != "item"sv) return;
      nameRequired = element.isProperty;
      currentItem = boost::make_shared<ViewItem>();
      HandleItem(element.widget, attributes);
      // An item that is neither a property nor a widget is dropped, and its
      // children read as if they stood in the view.
      if (!currentItem->path.description.empty() || !currentItem->widget.empty()) state = kInItem;
      return;
    }
    case kInItem:
    case kInNestedItem:
      StartInItem(ResolveItemAlternatives(localName), attributes);
      return;
  }
  state = kFailed;
  Report(ovracore::ZString("$$$/ovrametadata/view_parser/UnknownError=unknown error."));
}

void ViewDefinitionsHandler::StartView(const ovracore::Attributes& attributes) {
  currentView = boost::make_shared<ViewDefinition>();
  for (const ovracore::Attributes::Entry& attribute : attributes.All()) {
    if (!attribute.namespaceURI.empty() || attribute.value.empty()) continue;
    const UTF8String value(attribute.value);
    if (attribute.localName == "name"sv) {
      currentView->name = value;
    } else if (attribute.localName == "label"sv) {
      currentView->label = value;
    } else if (attribute.localName == "description"sv) {
      currentView->description = value;
    } else if (attribute.localName == "pruneEmptyProperties"sv) {
      currentView->pruneEmptyProperties = value == "true";
    }
  }
  if (currentView->name.empty()) {
    Report(ovracore::ZString("$$$/ovrametadata/view_parser/ViewHasNoName=<view> tag needs a name attribute."));
    state = kSkipping;
  } else {
    state = kInView;
  }
}

void ViewDefinitionsHandler::StartInItem(const ElementName& element, const ovracore::Attributes& attributes) {
  if (element.name == "param"sv) {
    currentItem->params[attributes.Get("name")] = attributes.Get("value");
    state = kInParam;
  } else if (element.name == "choice"sv) {
    const auto choice = boost::make_shared<ChoiceDefinition>();
    choice->rawValue = attributes.Get("value");
    choice->labelSource = ovracore::ToUTF16(attributes.Get("label"));
    choice->label = ovracore::ZString(attributes.Get("label"));
    currentItem->choices.push_back(choice);
    state = kInChoice;
  } else if (element.name == "item"sv) {
    itemStack.push_back(currentItem);
    nameRequired = element.isProperty;
    currentItem = boost::make_shared<ViewItem>();
    HandleItem(element.widget, attributes);
    // Nested items are kept even without a property or a widget.
    state = kInNestedItem;
  }
  // paramMap, paramList and anything else: their params and choices apply to
  // the enclosing item.
}

void ViewDefinitionsHandler::EndElement(const UTF8String& namespaceURI, const UTF8String& localName) {
  if (namespaceURI != kViewsUINamespace) return;
  switch (state) {
    case kInViews:
      if (localName != "views"sv) return;
      if (views.empty()) {
        state = kFailed;
        Report(ovracore::ZString(
            "$$$/ovrametadata/view_parser/NoViewTag=the view definition file has no <view> tag."));
      } else {
        state = kAfterRoot;
      }
      return;
    case kInView:
      if (localName != "view"sv) return;
      views.push_back(currentView);
      currentView.reset();
      state = kInViews;
      return;
    case kSkipping:
      if (localName == "view"sv) state = kInViews;
      return;
    case kInItem:
    case kInNestedItem: {
      if (ResolveItemAlternatives(localName).name != "item"sv) return;
      if (state == kInNestedItem) {
        const ViewItemPtr parent = itemStack.back();
        itemStack.pop_back();
        parent->AddItem(currentItem);
        currentItem = parent;
        state = itemStack.empty() ? kInItem : kInNestedItem;
      } else {
        currentView->items.push_back(currentItem);
        currentItem.reset();
        state = kInView;
      }
      nameRequired = false;
      return;
    }
    case kInParam:
      if (localName == "param"sv) state = itemStack.empty() ? kInItem : kInNestedItem;
      return;
    case kInChoice:
      if (localName == "choice"sv) state = itemStack.empty() ? kInItem : kInNestedItem;
      return;
    default:
      return;
  }
}

void ViewDefinitionsHandler::HandleItem(const UTF8String& elementWidget, const ovracore::Attributes& attributes) {
  ViewItem& item = *currentItem;
  if (!elementWidget.empty()) item.widget = elementWidget;
  // Document order: of a label and a labelRef, the later one is kept.
  for (const ovracore::Attributes::Entry& attribute : attributes.InDocumentOrder()) {
    if (!attribute.namespaceURI.empty()) continue;
    const std::string_view name = attribute.localName;
    const UTF8String value(attribute.value);
    if (name == "name"sv) {
      item.path = PathForQualifiedName(value);
      nameRequired = false;
      UTF8String uri, local;
      if (!item.path.description.empty() && ResolveQualifiedName(value, uri, local))
        item.qualifiedName = QualifiedName{uri, local};
    } else if (name == "widget"sv && elementWidget.empty()) {
      item.widget = value;
    } else if (name == "label"sv) {
      item.label = value;
    } else if (name == "description"sv) {
      item.description = value;
    } else if (name == "labelRef"sv || name == "descriptionRef"sv) {
      const Path path = PathForQualifiedName(value);
      if (path.description.empty()) continue;
      const boost::shared_ptr<EntryDefinition> entry = PathEntryDefinition(path);
      if (!entry) continue;
      const bool isLabel = name == "labelRef"sv;
      const UTF16String& text = isLabel ? entry->label : entry->description;
      if (!text.empty()) (isLabel ? item.label : item.description) = ovracore::ToUTF8(text);
    } else {
      const UTF8String key(name);
      item.params[key] = value;
      if (!boost::algorithm::ends_with(key, "_path")) continue;
      const Path path = PathForQualifiedName(value);
      if (path.description.empty()) continue;
      item.params[key + "_uri"] = path.namespaceURI;
      const UTF8String& expression = path.description;
      const std::size_t slash = expression.find('/');
      if (slash == UTF8String::npos) {
        item.params[key + "_name"] = expression;
      } else {
        item.params[key + "_name"] = expression.substr(0, slash);
        const std::size_t colon = expression.find(':');
        item.params[key + "_field"] = colon == UTF8String::npos ? UTF8String() : expression.substr(colon + 1);
      }
    }
  }
  if (nameRequired) {
    Report(ovracore::ZString(
        "$$$/ovrametadata/view_parser/PropertyWithoutName=found XMP property without a 'name' attribute."));
    // Said once: the next item starts afresh.
    nameRequired = false;
  }
}

bool ViewDefinitionsHandler::ResolveQualifiedName(const UTF8String& value, UTF8String& namespaceURI,
                                                  UTF8String& localName) {
  const std::vector<std::string_view> parts = SplitAtRuns(value, ':');
  if (parts.size() < 2) {
    Report(ovracore::ZString(kInvalidPrefix, {value}));
    return false;
  }
  if (parts.size() > 2 || parts[0].empty() || parts[1].empty()) return false;
  const auto found = prefixMap.find(parts[0]);
  if (found == prefixMap.end()) {
    Report(ovracore::ZString(kInvalidPrefix, {value}));
    return false;
  }
  namespaceURI = found->second.back();
  localName = parts[1];
  return true;
}

Path ViewDefinitionsHandler::PathForQualifiedName(const UTF8String& value) {
  const std::vector<std::string_view> parts = SplitAtRuns(value, '/');
  UTF8String uri, local;
  if (parts.size() == 2 && !parts[0].empty() && !parts[1].empty()) {
    if (!ResolveQualifiedName(UTF8String(parts[0]), uri, local)) return {};
    const Path structure = PathForSchemaNameAndPropertyName(uri, local);
    if (structure.description.empty()) {
      Report(ovracore::ZString(
          "$$$/ovrametadata/view_parser/InvalidXMPPropertyInStruct=invalid Structure in XMP property "
          "#{quot}@0#{quot}.",
          {value}));
      return {};
    }
    Path field;
    UTF8String fieldURI, fieldName;
    if (ResolveQualifiedName(UTF8String(parts[1]), fieldURI, fieldName)) {
      const boost::shared_ptr<FieldDefinition> definition =
          FieldNameDefinition(TypeEntryDefinition(structure), fieldName);
      if (definition && definition->namespaceURI == fieldURI) field = CreatePathFromStructureField(structure, definition);
    }
    if (field.description.empty()) {
      Report(ovracore::ZString(
          "$$$/ovrametadata/view_parser/InvalidXMPPropertyInStructureField=invalid Structure Field in XMP "
          "property #{quot}@0#{quot}.",
          {value}));
    }
    return field;
  }
  if (!ResolveQualifiedName(value, uri, local)) return {};
  Path path = PathForSchemaNameAndPropertyName(uri, local);
  if (path.description.empty()) {
    Report(ovracore::ZString("$$$/ovrametadata/view_parser/InvalidXMPProperty=invalid XMP property #{quot}@0#{quot}.",
                             {value}));
  }
  return path;
}

std::vector<ViewDefinitionPtr> ParseViewDefinitionsFromBuffer(const UTF8String& buffer, const UTF16String& source) {
  return Parse(source, [&](ovracore::Parser& parser) { return parser.ParseBuffer(buffer.data(), buffer.size()); });
}

std::vector<ViewDefinitionPtr> ParseViewDefinitionsFromDocument(const UTF16String& path) {
  return Parse(path, [&](ovracore::Parser& parser) { return parser.ParseFile(path); });
}

bool IsNotViewDefinition(const UTF16String& resourceName) {
  UTF16String title = resourceName;
  const std::size_t dot = title.rfind(u'.');
  if (dot != UTF16String::npos) title.erase(dot);
  const UTF8String lowered = ovracore::ToUTF8(title);
  return !boost::algorithm::iends_with(lowered, "_view");
}

void LoadAllViewDefinitions() {
  if (sLoadCount++ != 0) return;
  const ovracore::ResourceTable* module = LibraryResources();
  if (!module) return;
  for (const UTF8String& name : module->List("xml")) {
    const UTF16String source = ovracore::ToUTF16(name);
    if (IsNotViewDefinition(source)) continue;
    const auto contents = module->Read(name, "xml");
    if (!contents) continue;
    for (const ViewDefinitionPtr& view : ParseViewDefinitionsFromBuffer(UTF8String(*contents), source))
      AddViewDefinition(view, source);
  }
  LoadExtensionPackages();
}

void ResetViewLoadCount() { sLoadCount = 0; }

}  // namespace ovrametadata
