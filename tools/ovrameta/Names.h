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

// The registered names a name that does not resolve was probably meant
// as, at most three: the property of another case ("dc:Title", "DC:title"),
// or of that local name in any schema ("title", ExifTool's "Keywords").
// Empty when none is close, and for a prefix no schema has in any case
// (files may hold namespaces without a definition). What follows the first
// step ("/...", "[...]") is kept.
std::vector<std::string> SuggestName(const std::string& name);

// Whether argument has the shape of ExifTool's tag arguments: -Title=x,
// -XMP-dc:Title=x, -Rating, Rating=3, XMP-dc:Title. prefix:Property=VALUE
// and the tool's own options are not.
bool IsExifToolForm(const std::string& argument);

// The answer to an argument in ExifTool's form: ovrameta's way of saying
// it. Empty for a form without the dash ("Rating=3") when no property is
// close, as it may be meant otherwise.
std::string ExifToolAnswer(const std::string& argument);

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
// error to a sentence naming the property, or the names it was probably
// meant as (see SuggestName).
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
