#include "Names.h"

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <map>
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

std::string Lowered(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return text;
}

// "a", "a or b", "a, b or c".
std::string Alternatives(const std::vector<std::string>& names) {
  std::string text;
  for (std::size_t i = 0; i < names.size(); ++i)
    text += (i == 0 ? "" : i + 1 == names.size() ? " or " : ", ") + names[i];
  return text;
}

// ExifTool's names for values whose registered names differ from them.
const std::map<std::string, std::string> kExifToolTags = {
    {"keywords", "dc:subject"},       {"caption-abstract", "dc:description"},
    {"imagedescription", "dc:description"}, {"by-line", "dc:creator"},
    {"artist", "dc:creator"},         {"copyright", "dc:rights"},
    {"copyrightnotice", "dc:rights"}, {"objectname", "dc:title"},
};
const std::map<std::string, std::string> kExifToolGroups = {
    {"iptccore", "Iptc4xmpCore"}, {"iptcext", "Iptc4xmpExt"}};

// A tag argument of ExifTool taken apart: -GROUP:TAG+=VALUE.
struct TagArgument {
  bool dash = false;
  std::string group;
  std::string tag;
  char operation = 0;  // '+', '-' or '<' before the '='
  bool assigns = false;
  std::string value;
};

bool IsTagName(const std::string& text) {
  if (text.empty() || !std::isalpha(static_cast<unsigned char>(text[0]))) return false;
  return std::all_of(text.begin(), text.end(),
                     [](unsigned char c) { return std::isalnum(c) || c == '_' || c == '-'; });
}

bool ParseTagArgument(const std::string& argument, TagArgument& out) {
  out.dash = argument.size() > 1 && argument[0] == '-' && argument[1] != '-';
  const std::string body = out.dash ? argument.substr(1) : argument;
  const auto equals = body.find('=');
  std::string head = body.substr(0, equals);
  out.assigns = equals != std::string::npos;
  if (out.assigns) {
    out.value = body.substr(equals + 1);
    if (!head.empty() && (head.back() == '+' || head.back() == '-' || head.back() == '<')) {
      out.operation = head.back();
      head.pop_back();
    }
  }
  const auto colon = head.find(':');
  out.group = colon == std::string::npos ? std::string() : head.substr(0, colon);
  out.tag = colon == std::string::npos ? head : head.substr(colon + 1);
  return IsTagName(out.tag) && (colon == std::string::npos || IsTagName(out.group));
}

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

std::vector<std::string> SuggestName(const std::string& name) {
  const auto end = name.find_first_of("/[");
  const std::string head = name.substr(0, end);
  const std::string tail = end == std::string::npos ? std::string() : name.substr(end);
  const auto colon = head.find(':');
  const std::string prefix = colon == std::string::npos ? std::string() : Lowered(head.substr(0, colon));
  const std::string local = Lowered(colon == std::string::npos ? head : head.substr(colon + 1));
  if (local.empty()) return {};
  std::vector<std::string> found;
  const auto add = [&](const std::string& candidate) {
    if (found.size() < 3 && candidate + tail != name &&
        std::find(found.begin(), found.end(), candidate + tail) == found.end())
      found.push_back(candidate + tail);
  };
  const auto schemas = KnownSchemas();
  // Internal properties (an edit list's title) only when their schema is named.
  const auto matching = [&](const SchemaDefinitionPtr& schema, bool internal) {
    for (const auto& property : schema->properties) {
      if (property && (internal || !property->isInternal) && Lowered(property->name) == local)
        add(schema->prefix + ":" + property->name);
    }
  };
  if (!prefix.empty()) {
    const auto schema = std::find_if(schemas.begin(), schemas.end(),
                                     [&](const SchemaDefinitionPtr& s) { return Lowered(s->prefix) == prefix; });
    // Any prefix may be a namespace without a definition.
    if (schema == schemas.end()) return {};
    matching(*schema, true);
    if (!found.empty()) return found;
  } else {
    const auto tag = kExifToolTags.find(local);
    if (tag != kExifToolTags.end()) add(tag->second);
  }
  for (const auto& schema : schemas) matching(schema, false);
  return found;
}

bool IsExifToolForm(const std::string& argument) {
  TagArgument parsed;
  if (!ParseTagArgument(argument, parsed)) return false;
  const bool xmpGroup = Lowered(parsed.group.substr(0, 4)) == "xmp-";
  // -j4 and -r are the tool's options; ExifTool's tags start upper case.
  if (parsed.dash)
    return parsed.tag.size() > 1 &&
           (parsed.assigns || !parsed.group.empty() || std::isupper(static_cast<unsigned char>(parsed.tag[0])));
  return xmpGroup || (parsed.assigns && parsed.group.empty());
}

std::string ExifToolAnswer(const std::string& argument) {
  TagArgument parsed;
  if (!IsExifToolForm(argument) || !ParseTagArgument(argument, parsed)) return std::string();
  std::string prefix = parsed.group;
  if (Lowered(prefix.substr(0, 4)) == "xmp-") prefix = prefix.substr(4);
  const auto group = kExifToolGroups.find(Lowered(prefix));
  if (group != kExifToolGroups.end()) prefix = group->second;
  std::vector<std::string> names = prefix.empty() ? std::vector<std::string>() : SuggestName(prefix + ":" + parsed.tag);
  // ExifTool's groups (EXIF, IPTC) are not prefixes; the tag may still be known.
  if (names.empty()) names = SuggestName(parsed.tag);
  if (names.empty() && !parsed.dash) return std::string();
  std::string answer = Quoted(argument) + " is ExifTool's form; ovrameta ";
  if (names.empty()) return answer + "names properties prefix:Property (ovrameta schemas lists them)";
  if (!parsed.assigns) return answer + "reads " + Alternatives(names);
  if (parsed.operation) return answer + "names it " + Alternatives(names);
  if (parsed.value.empty()) return answer + "deletes with --delete " + Alternatives(names);
  for (auto& name : names) name += "=" + parsed.value;
  return answer + "writes " + Alternatives(names);
}

bool ResolveName(const std::string& fullName, ResolvedName& out, std::string& error) {
  std::string language;
  const std::string name = WithoutLanguage(fullName, &language);
  const auto segments = Split(name, '/');
  Segment first;
  // A name almost right ("title", "DC:Title") gets the registered one
  // rather than the reason.
  const auto unknown = [&](const std::string& reason) {
    const auto names = SuggestName(fullName);
    error = names.empty() ? reason : Quoted(fullName) + ": did you mean " + Alternatives(names) + "?";
    return false;
  };
  if (!ParseSegment(segments.front(), first))
    return unknown(Quoted(name) + " is not a property name (expected prefix:Property)");
  const auto schema = SchemaForPrefix(first.prefix);
  if (!schema) {
    return unknown(Quoted(name) + ": no schema is registered with the prefix " + Quoted(first.prefix) +
                   " (values without a definition can be read but not written; the README says how to add one)");
  }
  const std::string schemaLabel = LabelOr(schema->label, schema->prefix);
  Path path = PathForSchemaNameAndPropertyName(schema->namespaceURI, first.local);
  if (path.description.empty())
    return unknown(Quoted(name) + ": " + schemaLabel + " (" + schema->prefix + ") has no property " +
                   Quoted(first.local));
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
