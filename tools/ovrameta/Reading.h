// Private to the ovrameta tool (not part of the library's interface):
// reading the values of a packet into a tree of display nodes.
#pragma once

#include <functional>
#include <iosfwd>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include <boost/optional.hpp>
#include <boost/shared_ptr.hpp>

#include <ovrametadata/ovrametadata.h>

namespace ovrameta {

struct ValueNode {
  enum Kind { kSimple, kStruct, kArray };

  Kind kind = kSimple;
  std::string name;       // "dc:subject", "xmpDM:duration/xmpDM:scale", "dc:subject[2]"
  std::string label;      // the definition's label; "[2]" for an item
  std::string typeText;   // see TypeText
  std::string primitive;  // primitive type id; empty for a structure
  bool mixed = false;     // values differ between the files of an aggregate
  std::string value;      // display text (arrays: their items joined by "; ")
  std::string read;       // the value as the library gave it, before choice labels
  boost::optional<std::string> raw;  // stored text, when asked for and stored
  std::vector<ValueNode> children;   // fields of a structure, items of an array
  // Every language of a language alternative that holds more than the
  // default one, as (tag, text) in stored order.
  std::vector<std::pair<std::string, std::string>> languages;
};

// The paths a packet stores below one schema, written as Path::description
// writes them ("subject[2]", "Flash/exif:Fired").
using StoredPaths = std::set<std::string, std::less<>>;

struct ReadOptions {
  bool raw = false;    // also read the stored text of every value
  bool items = true;   // read the items of arrays of simple values one by one
  bool types = false;  // describe the type of every value (typeText)
  // When set, what the packet stores in the schema being read: looked up
  // instead of asking the packet about every path.
  const StoredPaths* stored = nullptr;
};

// Reads the value at path, named name. False when nothing is stored there
// (and, for internal properties, nothing can be constructed).
// entry, when given, is the definition of the path (spares looking it up).
bool ReadValue(XMPMetaRef xmp, const ovrametadata::Path& path, const std::string& name,
               const ReadOptions& options, ValueNode& out,
               boost::shared_ptr<ovrametadata::EntryDefinition> entry = nullptr);

struct SchemaValues {
  ovrametadata::SchemaDefinitionPtr schema;
  std::string label;
  std::vector<ValueNode> values;
};

// Every known schema (see KnownSchemas) that has values in the provider's
// packet, in order.
std::vector<SchemaValues> ReadAllValues(
    const boost::shared_ptr<ovrametadata::MetaDataProvider>& provider, const ReadOptions& options);

// What the packet stores in namespaces that no known schema describes, each
// under the prefix the packet declares, with raw values.
struct UndefinedValues {
  std::string prefix;
  std::string namespaceURI;
  std::vector<ValueNode> values;
};
std::vector<UndefinedValues> ReadUndefinedValues(XMPMetaRef xmp);

// The value named name ("x:Prop", "x:Prop[2]/y:Field", "x:Alt[@fr]") in a
// namespace without definition, found by the prefix the packet declares.
bool ReadUndefinedValue(XMPMetaRef xmp, const std::string& name, ValueNode& out);

// Prints head and text at indent; the continuation lines of a multi-line
// text line up under its first line.
void PrintLines(std::ostream& out, const std::string& indent, const std::string& head,
                const std::string& text);
// A value as "Label: value", structures and arrays below it, indented by
// two spaces per depth; "(mixed)" where an aggregate's files differ.
void PrintNode(std::ostream& out, const ValueNode& node, int depth);

}  // namespace ovrameta
