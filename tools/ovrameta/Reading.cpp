#include "Reading.h"

#include <ovrametadata/Initialize.h>
#include <ovrametadata/ValueEditing.h>
#include <ovrametadata/Values.h>

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

// The text as stored: the library formats internal properties for display
// unless metadata is forced writable, so the switch is on during the read.
boost::optional<std::string> ReadStoredText(XMPMetaRef xmp, const Path& path) {
  if (!HasValue(xmp, path)) return boost::none;
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
  return value;
}

// Items are probed one by one, which works for arrays at any depth.
template <class Visit>
void ForEachItem(XMPMetaRef xmp, const Path& arrayPath, Visit visit) {
  for (int index = 1; index <= kMaxItems; ++index) {
    Path item;
    try {
      item = CreatePathFromArrayItem(arrayPath, index);
    } catch (const std::exception&) {
      return;
    }
    if (item.description.empty() || !HasValue(xmp, item)) return;
    visit(item, index);
  }
}

void Describe(const EntryDefinition& entry, const boost::optional<PrimitiveType>& primitive,
              ValueNode& node) {
  node.label = LabelOr(entry.label, entry.name);
  node.typeText = TypeText(entry);
  node.primitive = primitive ? PrimitiveTypeAsPrimitiveTypeId(*primitive) : std::string();
}

}  // namespace

bool ReadValue(XMPMetaRef xmp, const Path& path, const std::string& name,
               const ReadOptions& options, ValueNode& out) {
  if (!xmp || path.description.empty()) return false;
  // Only internal properties can have a value without storing one.
  if (!path.internal && !HasValue(xmp, path)) return false;
  const auto entry = PathEntryDefinition(path);
  if (!entry) return false;
  const auto primitive = PrimitiveTypeOfPath(path);
  ValueNode node;
  node.name = name;
  Describe(*entry, primitive, node);

  if (const auto structType = StructTypeOf(path, *entry)) {
    if (!HasValue(xmp, path)) return false;
    node.kind = ValueNode::kStruct;
    for (const auto& field : structType->fields) {
      if (!field) continue;
      const Path fieldPath = FieldPath(path, *entry, field);
      ValueNode child;
      if (ReadValue(xmp, fieldPath, name + "/" + field->prefix + ":" + field->name, options,
                    child)) {
        node.children.push_back(std::move(child));
      }
    }
    if (node.children.empty()) return false;
    out = std::move(node);
    return true;
  }
  if (!primitive) return false;

  if (IsBagOrSeq(primitive)) {
    node.kind = ValueNode::kArray;
    const auto elementType = PropertyTypeOf(*entry);
    const bool structItems = elementType && !elementType->fields.empty();
    if (!structItems) {
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
      node.value = text;
      if (options.raw) node.raw = ReadStoredText(xmp, path);
      if (options.items) {
        ForEachItem(xmp, path, [&](const Path& item, int index) {
          ValueNode child;
          const std::string itemName = name + "[" + std::to_string(index) + "]";
          if (ReadValue(xmp, item, itemName, options, child)) {
            child.label = "[" + std::to_string(index) + "]";
            node.children.push_back(std::move(child));
          }
        });
      }
      out = std::move(node);
      return true;
    }
    if (!HasValue(xmp, path)) return false;
    ForEachItem(xmp, path, [&](const Path& item, int index) {
      ValueNode child;
      const std::string itemName = name + "[" + std::to_string(index) + "]";
      if (ReadValue(xmp, item, itemName, options, child)) {
        child.label = "[" + std::to_string(index) + "]";
        node.children.push_back(std::move(child));
      }
    });
    if (node.children.empty()) return false;
    out = std::move(node);
    return true;
  }

  UTF8String text;
  GetValueResult result = ValueAbsent;
  const bool found = GetValue(xmp, path, text, &result);
  if (result == ValueMixed) {
    node.mixed = true;
    out = std::move(node);
    return true;
  }
  if (!found) return false;
  node.value = DisplayText(*entry, text);
  if (options.raw) node.raw = ReadStoredText(xmp, path);
  out = std::move(node);
  return true;
}

std::vector<SchemaValues> ReadAllValues(XMPMetaRef xmp, const ReadOptions& options) {
  std::vector<SchemaValues> all;
  if (!xmp) return all;
  for (const auto& schema : KnownSchemas()) {
    SchemaValues values;
    values.schema = schema;
    values.label = LabelOr(schema->label, schema->prefix);
    for (const auto& property : schema->properties) {
      if (!property) continue;
      const Path path = CreatePathFromSchemaProperty(schema, property);
      ValueNode node;
      if (ReadValue(xmp, path, schema->prefix + ":" + property->name, options, node)) {
        values.values.push_back(std::move(node));
      }
    }
    if (!values.values.empty()) all.push_back(std::move(values));
  }
  return all;
}

}  // namespace ovrameta
