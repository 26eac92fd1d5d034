// Private to the ovrameta tool (not part of the library's interface): the
// schemas the tool knows, and property names such as "dc:title" or
// "xmpDM:duration/xmpDM:scale" resolved through the definitions registry.
#pragma once

#include <string>
#include <vector>

#include <ovrametadata/ovrametadata.h>

namespace ovrameta {

// Every schema the tool shows: the common schemas in loading order, then the
// library's auxiliary schemas (EXIF auxiliary, constructed values) that the
// registry holds outside the common list, then the dynamic schemas. Each
// namespace once.
std::vector<ovrametadata::SchemaDefinitionPtr> KnownSchemas();

// The schema registered under prefix; null when there is none.
ovrametadata::SchemaDefinitionPtr SchemaForPrefix(const std::string& prefix);

// Splits "dc:title[@fr]" into "dc:title" and, when language is given, "fr";
// other names come back whole.
std::string WithoutLanguage(const std::string& name, std::string* language);

// Whether text has the shape of a property name: a prefix (no "/" in it),
// a colon and a local name. Says nothing about whether it is registered.
bool LooksLikeName(const std::string& text);

struct ResolvedName {
  std::string name;  // as written by the user
  ovrametadata::Path path;
  boost::shared_ptr<ovrametadata::EntryDefinition> entry;
  std::string label;
  std::string language;  // "fr" of "dc:title[@fr]": one language of an alternative
};

// Resolves "prefix:Property", "prefix:Struct/prefix:Field" (any depth) and
// items "prefix:Array[2]" (1-based), and one language of an alternative
// "prefix:Alt[@fr]". On failure returns false and sets
// error to a sentence naming the property.
bool ResolveName(const std::string& name, ResolvedName& out, std::string& error);

// The allowed values of a choice entry: its own, else those of its type.
const std::vector<boost::shared_ptr<ovrametadata::ChoiceDefinition>>& ChoicesOf(
    const ovrametadata::EntryDefinition& entry);

// The primitive type of an entry, as PrimitiveTypeOfPath gives it for a
// path whose definition is entry.
boost::optional<ovrametadata::PrimitiveType> PrimitiveTypeOfEntry(
    const ovrametadata::EntryDefinition& entry);

// The structure type of the value at path (a structure property or field,
// or an item of an array of structures); null when it is not a structure.
ovrametadata::TypeDefinitionPtr StructTypeOf(const ovrametadata::Path& path,
                                             const ovrametadata::EntryDefinition& entry);

// The path of field inside the structure at path (see StructTypeOf).
ovrametadata::Path FieldPath(const ovrametadata::Path& path,
                             const ovrametadata::EntryDefinition& entry,
                             const boost::shared_ptr<ovrametadata::FieldDefinition>& field);

// "bag of text", "closedchoice of integer", "Time (structure)", "date".
std::string TypeText(const ovrametadata::EntryDefinition& entry);

}  // namespace ovrameta
