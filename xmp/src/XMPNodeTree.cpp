#include "XMPNodeTree.h"

#include <algorithm>

#include <ovraxmp/XMPIterator.h>

#include "XMPPacket.h"

namespace ovraxmp {
namespace detail {
namespace {

void ReadChildren(const XMPMeta& meta, const std::string& ns, const std::string& path, Node* node) {
  XMPIterator it(meta, ns, path, kXMP_IterJustChildren | kXMP_IterJustLeafName);
  std::string childNS, leaf, value;
  XMP_OptionBits options = 0;
  while (it.Next(&childNS, &leaf, &value, &options)) {
    Node child;
    child.ns = childNS;
    child.name = leaf;
    child.value = value;
    child.options = options;
    if (options & kXMP_PropIsQualifier) {
      node->qualifiers.push_back(std::move(child));
    } else {
      node->children.push_back(std::move(child));
    }
  }
  for (Node& child : node->children) {
    if ((child.options & kXMP_PropCompositeMask) || (child.options & kXMP_PropHasQualifiers))
      ReadChildren(meta, ns, ChildPath(path, child), &child);
  }
}

}  // namespace

std::string ChildPath(const std::string& parentPath, const Node& child) {
  if (child.options & kXMP_PropIsQualifier) return parentPath + "/?" + child.name;
  if (!child.name.empty() && child.name[0] == '[') return parentPath + child.name;
  return parentPath + "/" + child.name;
}

bool ReadNode(const XMPMeta& meta, const std::string& ns, const std::string& path, Node* node) {
  Node result;
  const std::optional<XMP_Node> read = meta.GetProperty(ns, path);
  if (!read) return false;
  result.value = read->value;
  result.options = read->options;
  result.ns = ns;
  if ((result.options & kXMP_PropCompositeMask) || (result.options & kXMP_PropHasQualifiers))
    ReadChildren(meta, ns, path, &result);
  *node = std::move(result);
  return true;
}

namespace {

void WriteQualifiers(XMPMeta& meta, const std::string& ns, const std::string& path, const Node& node) {
  for (const Node& qual : node.qualifiers) meta.SetProperty(ns, path + "/?" + qual.name, qual.value);
}

void WriteContent(XMPMeta& meta, const std::string& ns, const std::string& path, const Node& node) {
  if (node.options & kXMP_PropValueIsStruct) {
    for (const Node& field : node.children) {
      const std::string fieldPath = path + "/" + field.name;
      if (field.options & kXMP_PropCompositeMask) {
        meta.SetProperty(ns, fieldPath, std::string(), field.options & kXMP_PropCompositeMask);
        WriteContent(meta, ns, fieldPath, field);
      } else {
        meta.SetProperty(ns, fieldPath, field.value, field.options & kXMP_PropValueIsURI);
      }
      WriteQualifiers(meta, ns, fieldPath, field);
    }
  } else if (node.options & kXMP_PropValueIsArray) {
    XMP_Index index = 0;
    for (const Node& item : node.children) {
      ++index;
      const std::string itemPath = path + "[" + std::to_string(index) + "]";
      if (item.options & kXMP_PropCompositeMask) {
        meta.AppendArrayItem(ns, path, 0, std::string(), item.options & kXMP_PropCompositeMask);
        WriteContent(meta, ns, itemPath, item);
      } else {
        meta.AppendArrayItem(ns, path, 0, item.value, item.options & kXMP_PropValueIsURI);
      }
      WriteQualifiers(meta, ns, itemPath, item);
    }
  }
}

}  // namespace

void WriteNode(XMPMeta& meta, const std::string& ns, const std::string& path, const Node& node) {
  meta.DeleteProperty(ns, path);
  if (node.options & kXMP_PropCompositeMask) {
    meta.SetProperty(ns, path, std::string(), node.options & kXMP_PropCompositeMask);
    WriteContent(meta, ns, path, node);
  } else {
    meta.SetProperty(ns, path, node.value, node.options & kXMP_PropValueIsURI);
  }
  WriteQualifiers(meta, ns, path, node);
}

std::string Canonical(const Node& node) {
  std::string out;
  out += std::to_string(node.options & (kXMP_PropCompositeMask | kXMP_PropValueIsURI));
  out += '\x01';
  out += node.value;
  std::vector<std::string> parts;
  for (const Node& qual : node.qualifiers) parts.push_back(qual.ns + '\x02' + qual.name + '\x02' + qual.value);
  std::sort(parts.begin(), parts.end());
  for (const std::string& part : parts) out += '\x03' + part;
  parts.clear();
  const bool isArray = (node.options & kXMP_PropValueIsArray) != 0;
  for (const Node& child : node.children)
    parts.push_back(isArray ? Canonical(child) : child.ns + '\x02' + child.name + '\x02' + Canonical(child));
  const bool orderCounts = isArray && (node.options & kXMP_PropArrayIsOrdered);
  if (!orderCounts) std::sort(parts.begin(), parts.end());
  out += '\x04';
  for (const std::string& part : parts) {
    out += std::to_string(part.size());
    out += '\x05';
    out += part;
  }
  return out;
}

bool IsEmptyNode(const Node& node) {
  if (node.options & kXMP_PropCompositeMask) return node.children.empty();
  return node.value.empty();
}

std::vector<PropertyText> PropertyTexts(const XMPMeta& meta) {
  std::vector<PropertyText> texts;
  const IteratorHandle it(xmp_iterator_new(Require(meta.GetInternalRef()).Xmp(), nullptr, nullptr, XMP_ITER_PROPERTIES));
  if (!it) ThrowLastError(kXMPErr_InternalFailure, "starting an iteration");
  XmpString ns, path, value;
  std::uint32_t options = 0;
  while (xmp_iterator_next(it.get(), ns, path, value, &options)) {
    const std::string_view nodePath(xmp_string_cstr(path), xmp_string_len(path));
    if (nodePath.empty()) continue;  // a schema node
    const std::string_view name = nodePath.substr(0, nodePath.find_first_of("/["));
    if (texts.empty() || texts.back().key.name != name || texts.back().key.ns != xmp_string_cstr(ns))
      texts.push_back({{xmp_string_cstr(ns), std::string(name)}, std::string()});
    std::string& text = texts.back().text;
    text.append(nodePath.substr(name.size()));
    text += '\x01';
    text.append(xmp_string_cstr(value), xmp_string_len(value));
    text += '\x01';
    text += std::to_string(options & (kXMP_PropCompositeMask | kXMP_PropValueIsURI | kXMP_PropIsQualifier));
    text += '\x02';
  }
  return texts;
}

const std::vector<PropertyText>& CachedTexts(const XMPMeta& meta) { return Require(meta.GetInternalRef()).Texts(); }

std::vector<TopLevel> TopLevelProperties(const XMPMeta& meta, const std::string& onlyNS) {
  std::vector<TopLevel> result;
  std::vector<std::string> namespaces;
  if (onlyNS.empty()) {
    XMPIterator schemas(meta, kXMP_IterJustChildren);
    std::string ns;
    while (schemas.Next(&ns)) namespaces.push_back(ns);
  } else {
    namespaces.push_back(onlyNS);
  }
  for (const std::string& ns : namespaces) {
    XMPIterator props(meta, ns, kXMP_IterJustChildren);
    std::string path;
    while (props.Next(nullptr, &path)) result.push_back({ns, path});
  }
  return result;
}

}  // namespace detail
}  // namespace ovraxmp
