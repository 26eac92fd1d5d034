#include "Names.h"

#include <cstdlib>
#include <set>

#include "TextUtil.h"

namespace ovrameta {

using namespace ovrametadata;

namespace {

// The registry keeps these schemas outside the common list; a host that
// wants to show them asks for them by namespace.
const char* const kAuxiliaryNamespaces[] = {
    "http://ns.adobe.com/exif/1.0/aux/",
    "http://ns.ovrametadata.org/xmp/aggregate/1.0/",
    "http://ns.ovrametadata.org/swf/1.0/",
};

bool IsNameStart(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || c == '_';
}

bool IsNameChar(char c) {
  return IsNameStart(c) || (c >= '0' && c <= '9') || c == '-' || c == '.';
}

bool IsXMLName(const std::string& text) {
  if (text.empty() || !IsNameStart(text[0])) return false;
  for (char c : text) {
    if (!IsNameChar(c)) return false;
  }
  return true;
}

// One step of a name: "prefix:Local" and an optional item index.
struct Segment {
  std::string prefix;
  std::string local;
  int index = 0;  // 0: no item
};

bool ParseSegment(const std::string& text, Segment& out) {
  std::string body = text;
  out.index = 0;
  const auto open = body.find('[');
  if (open != std::string::npos) {
    if (body.back() != ']') return false;
    const std::string digits = body.substr(open + 1, body.size() - open - 2);
    if (digits.empty() || digits.size() > 6 ||
        digits.find_first_not_of("0123456789") != std::string::npos) {
      return false;
    }
    out.index = std::atoi(digits.c_str());
    if (out.index < 1) return false;
    body = body.substr(0, open);
  }
  const auto colon = body.find(':');
  if (colon == std::string::npos) return false;
  out.prefix = body.substr(0, colon);
  out.local = body.substr(colon + 1);
  return IsXMLName(out.prefix) && IsXMLName(out.local);
}

std::vector<std::string> Split(const std::string& text, char separator) {
  std::vector<std::string> parts;
  std::string::size_type start = 0;
  while (true) {
    const auto end = text.find(separator, start);
    parts.push_back(text.substr(start, end - start));
    if (end == std::string::npos) break;
    start = end + 1;
  }
  return parts;
}

std::string Quoted(const std::string& text) { return "\"" + text + "\""; }

}  // namespace

std::vector<SchemaDefinitionPtr> KnownSchemas() {
  // The registry is filled at start-up and not changed while the tool runs;
  // the list is made once (files are read on several threads).
  static const std::vector<SchemaDefinitionPtr> schemas = [] {
    std::vector<SchemaDefinitionPtr> list;
    std::set<std::string> seen;
    auto add = [&](const SchemaDefinitionPtr& schema) {
      if (schema && seen.insert(schema->namespaceURI).second) list.push_back(schema);
    };
    for (const auto& schema : CommonSchemaDefinitions()) add(schema);
    for (const char* uri : kAuxiliaryNamespaces) add(NamespaceDefinition(uri));
    for (const auto& schema : DynamicSchemaDefinitions()) add(schema);
    return list;
  }();
  return schemas;
}

SchemaDefinitionPtr SchemaForPrefix(const std::string& prefix) {
  for (const auto& schema : KnownSchemas()) {
    if (schema->prefix == prefix) return schema;
  }
  return SchemaDefinitionPtr();
}

std::string WithoutLanguage(const std::string& name, std::string* language) {
  const auto open = name.rfind("[@");
  if (open == std::string::npos || name.back() != ']') return name;
  if (language) *language = name.substr(open + 2, name.size() - open - 3);
  return name.substr(0, open);
}

bool LooksLikeName(const std::string& full) {
  const std::string text = WithoutLanguage(full, nullptr);
  const auto colon = text.find(':');
  if (colon == std::string::npos || colon == 0) return false;
  if (text.substr(0, colon).find('/') != std::string::npos) return false;
  Segment segment;
  return ParseSegment(Split(text, '/').front(), segment);
}

const std::vector<boost::shared_ptr<ChoiceDefinition>>& ChoicesOf(const EntryDefinition& entry) {
  if (!entry.constraints.choices.empty() || !entry.type) return entry.constraints.choices;
  if (const auto type = TypeIdDefinition(*entry.type)) return type->constraints.choices;
  return entry.constraints.choices;
}

boost::optional<PrimitiveType> PrimitiveTypeOfEntry(const EntryDefinition& entry) {
  if (entry.type) return PrimitiveTypeOf(*entry.type);
  return entry.extends;
}

TypeDefinitionPtr StructTypeOf(const Path& /*path*/, const EntryDefinition& entry) {
  // An item of an array of structures resolves to the structure type itself.
  if (const auto* type = dynamic_cast<const TypeDefinition*>(&entry)) {
    if (!type->fields.empty()) return TypeIdDefinition(type->name);
  }
  if (PrimitiveTypeOfEntry(entry) || !entry.type) return TypeDefinitionPtr();
  const auto type = TypeIdDefinition(*entry.type);
  return type && !type->fields.empty() ? type : TypeDefinitionPtr();
}

Path FieldPath(const Path& path, const EntryDefinition& entry,
               const boost::shared_ptr<FieldDefinition>& field) {
  try {
    if (dynamic_cast<const TypeDefinition*>(&entry)) {
      return CreatePathFromArrayedStructureField(path, field);
    }
    return CreatePathFromStructureField(path, field);
  } catch (const std::exception&) {
    // A field the toolkit cannot address has no path; callers skip it.
    return Path();
  }
}

bool ResolveName(const std::string& fullName, ResolvedName& out, std::string& error) {
  std::string language;
  const std::string name = WithoutLanguage(fullName, &language);
  const auto segments = Split(name, '/');
  Segment first;
  if (!ParseSegment(segments.front(), first)) {
    error = Quoted(name) + " is not a property name (expected prefix:Property)";
    return false;
  }
  const auto schema = SchemaForPrefix(first.prefix);
  if (!schema) {
    error = Quoted(name) + ": no schema is registered with the prefix " + Quoted(first.prefix) +
            " (values without a definition can be read but not written; the README says how to add one)";
    return false;
  }
  const std::string schemaLabel = LabelOr(schema->label, schema->prefix);
  Path path = PathForSchemaNameAndPropertyName(schema->namespaceURI, first.local);
  if (path.description.empty()) {
    error = Quoted(name) + ": " + schemaLabel + " (" + schema->prefix +
            ") has no property " + Quoted(first.local);
    return false;
  }
  auto entry = PathEntryDefinition(path);
  std::string walked = first.prefix + ":" + first.local;
  auto takeItem = [&](int index) -> bool {
    const auto primitive = PrimitiveTypeOfPath(path);
    if (!primitive || (*primitive != kPrimitiveType_bag && *primitive != kPrimitiveType_seq)) {
      error = Quoted(name) + ": " + walked + " is not an array";
      return false;
    }
    try {
      path = CreatePathFromArrayItem(path, index);
    } catch (const std::exception&) {
      path = Path();
    }
    entry = path.description.empty() ? nullptr : PathEntryDefinition(path);
    if (!entry) {
      error = Quoted(name) + ": the items of " + walked + " cannot be addressed";
      return false;
    }
    walked += "[" + std::to_string(index) + "]";
    return true;
  };
  if (!entry) {
    error = Quoted(name) + ": the property has no definition";
    return false;
  }
  if (first.index > 0 && !takeItem(first.index)) return false;

  for (std::size_t i = 1; i < segments.size(); ++i) {
    Segment segment;
    if (!ParseSegment(segments[i], segment)) {
      error = Quoted(name) + ": " + Quoted(segments[i]) + " is not a field name (expected prefix:Field)";
      return false;
    }
    const auto type = StructTypeOf(path, *entry);
    if (!type) {
      const auto primitive = PrimitiveTypeOfPath(path);
      if (primitive && (*primitive == kPrimitiveType_bag || *primitive == kPrimitiveType_seq)) {
        error = Quoted(name) + ": " + walked + " is an array; name one of its items, as in " +
                walked + "[1]/" + segments[i];
      } else {
        error = Quoted(name) + ": " + walked + " is not a structure";
      }
      return false;
    }
    const auto field = FieldNameDefinition(type, segment.local);
    if (!field || field->prefix != segment.prefix) {
      error = Quoted(name) + ": the structure " + type->name + " of " + walked +
              " has no field " + Quoted(segment.prefix + ":" + segment.local);
      return false;
    }
    path = FieldPath(path, *entry, field);
    entry = path.description.empty() ? nullptr : PathEntryDefinition(path);
    if (!entry) {
      error = Quoted(name) + ": the field " + Quoted(segments[i]) + " cannot be addressed";
      return false;
    }
    walked += "/" + segment.prefix + ":" + segment.local;
    if (segment.index > 0 && !takeItem(segment.index)) return false;
  }
  if (name != fullName) {
    const auto primitive = PrimitiveTypeOfPath(path);
    if (!primitive || *primitive != kPrimitiveType_alt) {
      error = Quoted(fullName) + ": " + walked + " is not a language alternative";
      return false;
    }
    if (language.empty()) {
      error = Quoted(fullName) + ": no language given (as in " + walked + "[@fr])";
      return false;
    }
  }
  out.name = fullName;
  out.language = language;
  out.path = path;
  out.entry = entry;
  out.label = LabelOr(entry->label, entry->name);
  return true;
}

std::string TypeText(const EntryDefinition& entry) {
  const std::string typeId = entry.type ? *entry.type : std::string("text");
  if (typeId == "date") return typeId;
  const auto primitive = PrimitiveTypeOf(entry);
  if (!primitive) return typeId + " (structure)";
  std::string text = typeId;
  if (PrimitiveTypeIsArray(*primitive) || PrimitiveTypeIsChoice(*primitive)) {
    if (const auto element = ElementTypeIdOf(entry)) {
      text += " of " + *element;
      if (const auto elementType = TypeIdDefinition(*element)) {
        if (!elementType->fields.empty()) text += " (structure)";
      }
    }
  }
  return text;
}

}  // namespace ovrameta
