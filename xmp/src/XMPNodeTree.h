// Not part of the interface: subtrees of a packet read into memory, so that
// the whole-packet utilities can compare, copy and merge them.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include <ovraxmp/XMPMeta.h>

#include "XMPPacket.h"

namespace ovraxmp {
namespace detail {

struct Node {
  std::string ns;    // namespace of a field or qualifier (empty for items)
  std::string name;  // "prefix:name" of a field or qualifier, "[i]" of an item
  std::string value;
  XMP_OptionBits options = 0;
  std::vector<Node> children;    // fields or items, in document order
  std::vector<Node> qualifiers;  // in document order
};

// Reads the node at (ns, path); false when absent.
bool ReadNode(const XMPMeta& meta, const std::string& ns, const std::string& path, Node* node);
// Writes node at (ns, path), replacing whatever is there.
void WriteNode(XMPMeta& meta, const std::string& ns, const std::string& path, const Node& node);
// A text equal for two nodes exactly when their values are equal: item
// order counts except in unordered arrays, qualifiers count, struct fields
// and qualifiers compare by name.
std::string Canonical(const Node& node);
// A simple node with an empty value, or a composite node without children.
bool IsEmptyNode(const Node& node);

// Every top-level property (see TopLevel), in document order.
std::vector<TopLevel> TopLevelProperties(const XMPMeta& meta, const std::string& onlyNS = std::string());

// Every top-level property in document order with its text (see
// PropertyText); one walk of the packet. TextsOf keeps the answer in the
// packet until its content changes.
std::vector<PropertyText> PropertyTexts(const XMPMeta& meta);
const std::vector<PropertyText>& CachedTexts(const XMPMeta& meta);

// The path of a child of the node at parentPath.
std::string ChildPath(const std::string& parentPath, const Node& child);

}  // namespace detail
}  // namespace ovraxmp
