#include "Reading.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <ostream>
#include <set>

#include <boost/make_shared.hpp>

#include <ovrametadata/ovrametadata.h>

#include "Names.h"
#include "TextUtil.h"

namespace ovrameta {

using namespace ovrametadata;

namespace {

// Arrays longer than this are shown by their first items only; a guard
// against pathological files, not a limit anyone meets.
constexpr int kMaxItems = 100000;

bool IsBagOrSeq(const boost::optional<PrimitiveType>& primitive) {
  return primitive && (*primitive == kPrimitiveType_bag || *primitive == kPrimitiveType_seq);
}

// Whether the packet stores a value at path. The list of stored paths,
// when there is one, answers without a query per path (a run over many
// files asks for every field and item of every stored property).
bool IsStored(XMPMetaRef xmp, const Path& path, const ReadOptions& options) {
  if (!options.stored) return HasValue(xmp, path);
  return options.stored->count(path.description) != 0;
}

// The text as stored: the library formats internal properties for display
// unless metadata is forced writable, so the switch is on during the read.
boost::optional<std::string> ReadStoredText(XMPMetaRef xmp, const Path& path,
                                            const ReadOptions& options) {
  if (!IsStored(xmp, path, options)) return boost::none;
  const bool forced = IsAllMetadataForcedWritable();
  if (!forced) ForcedAllMetadataWritable(true);
  UTF8String text;
  const bool found = GetValue(xmp, path, text);
  if (!forced) ForcedAllMetadataWritable(false);
  if (!found) return boost::none;
  return text;
}

std::string DisplayText(const EntryDefinition& entry, const std::string& value) {
  for (const auto& choice : ChoicesOf(entry)) {
    if (choice && choice->rawValue == value) return LabelOr(choice->label, value);
  }
  // A numeric choice written in another form ("5.0" for "5").
  const auto number = [](const std::string& text) -> boost::optional<double> {
    double parsed = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), parsed);
    if (text.empty() || error != std::errc() || end != text.data() + text.size()) return boost::none;
    return parsed;
  };
  const auto wanted = number(value);
  if (!wanted) return value;
  for (const auto& choice : ChoicesOf(entry)) {
    if (choice && number(choice->rawValue) == wanted) return LabelOr(choice->label, value);
  }
  return value;
}

// Items are probed one by one, which works for arrays at any depth.
template <class Visit>
void ForEachItem(XMPMetaRef xmp, const Path& arrayPath, const ReadOptions& options, Visit visit) {
  for (int index = 1; index <= kMaxItems; ++index) {
    Path item;
    try {
      item = CreatePathFromArrayItem(arrayPath, index);
    } catch (const std::exception&) {
      return;
    }
    if (item.description.empty() || !IsStored(xmp, item, options)) return;
    visit(item, index);
  }
}

void Describe(const EntryDefinition& entry, const boost::optional<PrimitiveType>& primitive,
              bool types, ValueNode& node) {
  node.label = LabelOr(entry.label, entry.name);
  if (types) node.typeText = TypeText(entry);
  node.primitive = primitive ? PrimitiveTypeAsPrimitiveTypeId(*primitive) : std::string();
}

// Only internal properties can have a value without storing one; asking
// for the constructed value directly spares resolving the definition of
// every absent property.
bool ReadConstructedValue(XMPMetaRef xmp, const Path& path, const std::string& name,
                          const EntryDefinition& entry, bool types, ValueNode& out) {
  UTF8String constructed;
  GetValueResult result = ValueAbsent;
  if (!path.internal || !GetConstructedValue(xmp, path, constructed, &result)) return false;
  ValueNode node;
  node.name = name;
  Describe(entry, PrimitiveTypeOfEntry(entry), types, node);
  node.value = DisplayText(entry, constructed);
  out = std::move(node);
  return true;
}

void ReadLanguages(XMPMetaRef xmp, const Path& path, ValueNode& node) {
  const auto languages = GetAltTextLanguages(xmp, path);
  if (languages.empty() || (languages.size() == 1 && languages.front() == "x-default")) return;
  for (const auto& language : languages) {
    UTF8String text;
    if (GetAltTextValue(xmp, path, language, text)) node.languages.emplace_back(language, text);
  }
}

}  // namespace

bool ReadValue(XMPMetaRef xmp, const Path& path, const std::string& name,
               const ReadOptions& options, ValueNode& out,
               boost::shared_ptr<EntryDefinition> entry) {
  if (!xmp || path.description.empty()) return false;
  if (!IsStored(xmp, path, options)) {
    if (!path.internal) return false;
    if (!entry) entry = PathEntryDefinition(path);
    return entry && ReadConstructedValue(xmp, path, name, *entry, options.types, out);
  }
  if (!entry) entry = PathEntryDefinition(path);
  if (!entry) return false;
  const auto primitive = PrimitiveTypeOfEntry(*entry);
  ValueNode node;
  node.name = name;
  Describe(*entry, primitive, options.types, node);

  if (const auto structType = StructTypeOf(path, *entry)) {
    node.kind = ValueNode::kStruct;
    for (const auto& field : structType->fields) {
      if (!field) continue;
      const Path fieldPath = FieldPath(path, *entry, field);
      ValueNode child;
      if (ReadValue(xmp, fieldPath, name + "/" + field->prefix + ":" + field->name, options,
                    child, field)) {
        node.children.push_back(std::move(child));
      }
    }
    if (node.children.empty()) return false;
    out = std::move(node);
    return true;
  }
  if (!primitive) return false;

  const bool array = IsBagOrSeq(primitive);
  const auto readItems = [&] {
    ForEachItem(xmp, path, options, [&](const Path& item, int index) {
      ValueNode child;
      const std::string itemName = name + "[" + std::to_string(index) + "]";
      if (ReadValue(xmp, item, itemName, options, child)) {
        child.label = "[" + std::to_string(index) + "]";
        node.children.push_back(std::move(child));
      }
    });
  };
  if (array) {
    node.kind = ValueNode::kArray;
    const auto elementType = PropertyTypeOf(*entry);
    if (elementType && !elementType->fields.empty()) {
      readItems();
      if (node.children.empty()) return false;
      out = std::move(node);
      return true;
    }
  }

  // Read as a whole first: that is where an aggregate says "mixed".
  UTF8String text;
  GetValueResult result = ValueAbsent;
  const bool found = GetValue(xmp, path, text, &result);
  if (result == ValueMixed) {
    node.mixed = true;
    out = std::move(node);
    return true;
  }
  if (!found) return false;
  if (array) {
    node.value = text;
    if (options.items) readItems();
  } else {
    node.read = text;
    node.value = DisplayText(*entry, text);
    if (options.items && *primitive == kPrimitiveType_alt) ReadLanguages(xmp, path, node);
    // The library formats internal properties itself; dates and GPS
    // coordinates of editorial properties are formatted here. Their rationals
    // (a time scale of 1/1000) read better as stored than with two decimals.
    const bool formatHere = entry->type && (*entry->type == "date" || *entry->type == "gpscoordinate");
    if (!path.internal && formatHere && node.value == text) {
      const UTF8String formatted = FormatValue(xmp, path, text);
      if (!formatted.empty()) node.value = formatted;
    }
  }
  if (options.raw) node.raw = ReadStoredText(xmp, path, options);
  out = std::move(node);
  return true;
}

namespace {

struct PropertyRef {
  PropertyDefinitionPtr property;
  Path path;
  std::string name;
};

struct SchemaRef {
  SchemaDefinitionPtr schema;
  std::string label;
  std::vector<PropertyRef> properties;
};

// The paths of every known property, built once: a run over many files asks
// for the same properties in every file.
std::vector<SchemaRef> BuildKnownProperties() {
  std::vector<SchemaRef> schemas;
  for (const auto& schema : KnownSchemas()) {
    SchemaRef ref;
    ref.schema = schema;
    ref.label = LabelOr(schema->label, schema->prefix);
    for (const auto& property : schema->properties) {
      if (!property) continue;
      PropertyRef propertyRef;
      propertyRef.property = property;
      propertyRef.path = CreatePathFromSchemaProperty(schema, property);
      propertyRef.name = schema->prefix + ":" + property->name;
      ref.properties.push_back(std::move(propertyRef));
    }
    schemas.push_back(std::move(ref));
  }
  return schemas;
}

// Built once (files are read on several threads).
const std::vector<SchemaRef>& KnownProperties() {
  static const std::vector<SchemaRef> schemas = BuildKnownProperties();
  return schemas;
}

}  // namespace

namespace {

// What the provider's packet stores in namespaceURI: the aggregate provider
// lists every stored property path of a namespace, which spares asking for
// each of the hundreds of defined properties (and their fields and items)
// in turn. names gets the local names of the top-level properties.
void ListStored(AggregateProvider& presence, const std::string& namespaceURI, StoredPaths& paths,
                std::set<std::string, std::less<>>& names) {
  std::vector<PropertyDefinitionPtr> stored;
  presence.GetAllPathsForDynamicSchema(namespaceURI, stored);
  paths.clear();
  names.clear();
  for (const auto& property : stored) {
    if (!property) continue;
    paths.insert(property->name);
    names.insert(property->name.substr(0, property->name.find_first_of("/[?")));
  }
}

}  // namespace

namespace {
ValueNode StoredValueNode(const StoredNode& stored, const std::string& name, const std::string& label);

// The stored top-level properties of namespaceURI that its schema does not
// define: shown as stored rather than left out.
void AddUndefinedProperties(XMPMetaRef xmp, const SchemaRef& schema,
                            const std::set<std::string, std::less<>>& names, SchemaValues& values) {
  std::set<std::string, std::less<>> defined;
  for (const auto& property : schema.properties) defined.insert(property.property->name);
  if (std::all_of(names.begin(), names.end(), [&](const std::string& n) { return defined.count(n) != 0; })) return;
  for (const StoredNode& stored : GetStoredNodes(xmp, schema.schema->namespaceURI)) {
    if (!defined.count(stored.name.substr(stored.name.find(':') + 1)))
      values.values.push_back(StoredValueNode(stored, stored.name, stored.name));
  }
}
}  // namespace

std::vector<SchemaValues> ReadAllValues(const boost::shared_ptr<MetaDataProvider>& provider,
                                        const ReadOptions& options) {
  std::vector<SchemaValues> all;
  MetaDataReadAccess reader(provider);
  XMPMetaRef xmp = *reader;
  if (!xmp) return all;
  auto presence = boost::dynamic_pointer_cast<AggregateProvider>(provider);
  // One file: the listed paths are those of the packet read here, so they
  // answer for every field and item too. An aggregate's merged packet need
  // not hold what one of its members does; it is asked path by path.
  const bool oneFile = !presence;
  if (!presence) {
    // Not rebuilt: only its listing of stored paths is used, and a rebuild
    // would register the packet's dynamic schemas in the process-wide
    // tables, which files read on other threads are looking at.
    presence = boost::make_shared<AggregateProvider>();
    presence->AddProvider(provider, false);
  }
  StoredPaths paths;
  std::set<std::string, std::less<>> names;
  ReadOptions schemaOptions = options;
  if (oneFile) schemaOptions.stored = &paths;
  for (const auto& schema : KnownProperties()) {
    ListStored(*presence, schema.schema->namespaceURI, paths, names);
    SchemaValues values;
    for (const auto& property : schema.properties) {
      ValueNode node;
      if (names.count(property.property->name)) {
        if (ReadValue(xmp, property.path, property.name, schemaOptions, node, property.property)) {
          values.values.push_back(std::move(node));
        }
      } else if (property.path.internal &&
                 ReadConstructedValue(xmp, property.path, property.name, *property.property,
                                      options.types, node)) {
        values.values.push_back(std::move(node));
      }
    }
    AddUndefinedProperties(xmp, schema, names, values);
    if (values.values.empty()) continue;
    values.schema = schema.schema;
    values.label = schema.label;
    all.push_back(std::move(values));
  }
  return all;
}

namespace {

// Kept in memory only; never part of a file's metadata.
const char kTransientNamespace[] = "http://ns.adobe.com/xmp/transient/1.0/";

std::string JoinTexts(const std::vector<std::string>& texts) {
  std::string joined;
  for (const auto& text : texts) joined += (joined.empty() ? "" : "; ") + text;
  return joined;
}

bool EqualsIgnoringCase(const std::string& a, const std::string& b) {
  return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](char x, char y) {
           return std::tolower(static_cast<unsigned char>(x)) == std::tolower(static_cast<unsigned char>(y));
         });
}

// A node as stored, shown without a definition: an alternative of
// languages reads as its default text with the others beside it.
ValueNode StoredValueNode(const StoredNode& stored, const std::string& name, const std::string& label) {
  ValueNode node;
  node.name = name;
  node.label = label;
  const bool languages = stored.kind == StoredNode::kArray && !stored.children.empty() &&
                         std::all_of(stored.children.begin(), stored.children.end(), [](const StoredNode& item) {
                           return item.kind == StoredNode::kSimple && !item.language.empty();
                         });
  if (languages) {
    node.typeText = "alt of text";
    node.value = stored.children.front().value;
    for (const StoredNode& item : stored.children) {
      if (item.language == "x-default") node.value = item.value;
      node.languages.emplace_back(item.language, item.value);
    }
  } else if (stored.kind == StoredNode::kSimple) {
    node.typeText = "text";
    node.value = stored.value;
  } else {
    node.kind = stored.kind == StoredNode::kArray ? ValueNode::kArray : ValueNode::kStruct;
    node.typeText = node.kind == ValueNode::kArray ? "array" : "structure";
    std::vector<std::string> texts;
    for (const StoredNode& child : stored.children) {
      const bool item = child.name.front() == '[';
      node.children.push_back(StoredValueNode(child, name + (item ? "" : "/") + child.name, child.name));
      if (item && child.kind == StoredNode::kSimple) texts.push_back(child.value);
    }
    if (node.kind == ValueNode::kArray && texts.size() == stored.children.size()) node.value = JoinTexts(texts);
  }
  node.read = node.value;
  node.raw = node.value;
  return node;
}

std::set<std::string> KnownNamespaces() {
  std::set<std::string> known;
  for (const auto& schema : KnownSchemas()) known.insert(schema->namespaceURI);
  return known;
}

}  // namespace

std::vector<UndefinedValues> ReadUndefinedValues(XMPMetaRef xmp) {
  std::vector<UndefinedValues> all;
  static const std::set<std::string> known = KnownNamespaces();
  for (const StoredNamespace& ns : GetStoredNamespaces(xmp)) {
    if (known.count(ns.namespaceURI) || ns.namespaceURI == kTransientNamespace) continue;
    UndefinedValues values{ns.prefix, ns.namespaceURI, {}};
    for (const StoredNode& stored : GetStoredNodes(xmp, ns.namespaceURI))
      values.values.push_back(StoredValueNode(stored, stored.name, stored.name));
    if (!values.values.empty()) all.push_back(std::move(values));
  }
  return all;
}

bool ReadUndefinedValue(XMPMetaRef xmp, const std::string& fullName, ValueNode& out) {
  std::string language;
  const std::string name = WithoutLanguage(fullName, &language);
  const std::string prefix = name.substr(0, name.find(':'));
  for (const StoredNamespace& ns : GetStoredNamespaces(xmp)) {
    if (ns.prefix != prefix) continue;
    const std::vector<StoredNode> top = GetStoredNodes(xmp, ns.namespaceURI);
    // Walks "x:A[2]/y:B" step by step: names, then bracketed items.
    const std::vector<StoredNode>* level = &top;
    const StoredNode* found = nullptr;
    std::size_t at = 0;
    while (at < name.size()) {
      std::size_t end = name.find_first_of("/[", at + 1);
      if (end == std::string::npos) end = name.size();
      if (name[at] == '[') end = name.find(']', at) + 1;
      if (end == 0) return false;
      const std::string step = name.substr(at, end - at);
      const auto match = std::find_if(level->begin(), level->end(), [&](const StoredNode& n) { return n.name == step; });
      if (match == level->end()) return false;
      found = &*match;
      level = &found->children;
      at = end < name.size() && name[end] == '/' ? end + 1 : end;
    }
    if (!found) return false;
    ValueNode node = StoredValueNode(*found, fullName, found->name);
    if (!language.empty()) {
      const auto text = std::find_if(node.languages.begin(), node.languages.end(),
                                     [&](const auto& l) { return EqualsIgnoringCase(l.first, language); });
      if (text == node.languages.end()) return false;
      ValueNode one;
      one.name = fullName;
      one.label = found->name + " [" + text->first + "]";
      one.typeText = "text";
      one.value = one.read = text->second;
      one.raw = text->second;
      node = std::move(one);
    }
    out = std::move(node);
    return true;
  }
  return false;
}

void PrintLines(std::ostream& out, const std::string& indent, const std::string& head,
                const std::string& text) {
  // Continuation lines of a multi-line value line up under its first line.
  out << indent << head;
  const std::string continuation = indent + std::string(head.size(), ' ');
  std::string::size_type start = 0;
  while (true) {
    const auto end = text.find('\n', start);
    out << text.substr(start, end - start) << '\n';
    if (end == std::string::npos) break;
    out << continuation;
    start = end + 1;
  }
}

void PrintNode(std::ostream& out, const ValueNode& node, int depth) {
  const std::string indent(static_cast<std::size_t>(depth) * 2, ' ');
  if (node.mixed) {
    out << indent << node.label << ": (mixed)\n";
    return;
  }
  switch (node.kind) {
    case ValueNode::kSimple:
      PrintLines(out, indent, node.label + ": ", node.value);
      for (const auto& language : node.languages) {
        if (language.first != "x-default")
          PrintLines(out, indent + "  ", "[" + language.first + "] ", language.second);
      }
      break;
    case ValueNode::kStruct:
      out << indent << node.label << ":\n";
      for (const auto& child : node.children) PrintNode(out, child, depth + 1);
      break;
    case ValueNode::kArray:
      if (node.children.empty()) {
        PrintLines(out, indent, node.label + ": ", node.value);
        break;
      }
      out << indent << node.label << ":\n";
      for (const auto& item : node.children) {
        if (item.kind == ValueNode::kSimple) {
          PrintLines(out, indent + "  ", "- ", item.value);
        } else {
          out << indent << "  " << item.label << "\n";
          for (const auto& child : item.children) PrintNode(out, child, depth + 2);
        }
      }
      break;
  }
}

}  // namespace ovrameta
