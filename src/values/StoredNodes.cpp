// What a packet stores, read without definitions: namespaces that no
// definition describes are shown as they stand.
#include <ovrametadata/Values.h>

#include <ovraxmp/XMPToolkit.h>

namespace ovrametadata {

namespace {

using ovraxmp::XMPIterator;
using ovraxmp::XMPMeta;

// Deeper nesting than any real packet holds is not followed.
constexpr int kMaxDepth = 64;

// The last step of a toolkit path: "[2]" of "dc:subject[2]", "stDim:w" of
// "mwg-rs:Regions/mwg-rs:AppliedToDimensions/stDim:w".
UTF8String LastStep(const std::string& path) {
  const auto slash = path.rfind('/');
  const auto bracket = path.rfind('[');
  if (bracket != std::string::npos && (slash == std::string::npos || bracket > slash)) {
    return path.substr(bracket);
  }
  return slash == std::string::npos ? path : path.substr(slash + 1);
}

StoredNode::Kind KindOf(ovraxmp::XMP_OptionBits options) {
  if (options & ovraxmp::kXMP_PropValueIsArray) return StoredNode::kArray;
  if (options & ovraxmp::kXMP_PropValueIsStruct) return StoredNode::kStruct;
  return StoredNode::kSimple;
}

void ReadChildren(const XMPMeta& meta, const std::string& ns, const std::string& path,
                  StoredNode& node, int depth) {
  XMPIterator children(meta, ns, path, ovraxmp::kXMP_IterJustChildren);
  std::string childNS, childPath, value;
  ovraxmp::XMP_OptionBits options = 0;
  std::vector<std::pair<std::string, StoredNode>> composites;
  while (children.Next(&childNS, &childPath, &value, &options)) {
    if (childPath.empty() || childPath == path) continue;
    if (options & ovraxmp::kXMP_PropIsQualifier) {
      // Of the qualifiers only the language is shown; it tags its value.
      if (LastStep(childPath) == "?xml:lang") node.language = value;
      continue;
    }
    StoredNode child;
    child.kind = KindOf(options);
    child.name = LastStep(childPath);
    if (child.kind == StoredNode::kSimple) child.value = value;
    node.children.push_back(std::move(child));
    if ((options & ovraxmp::kXMP_PropCompositeMask) != 0 || (options & ovraxmp::kXMP_PropHasQualifiers)) {
      composites.emplace_back(childPath, StoredNode());
    }
  }
  if (depth >= kMaxDepth) return;
  // Children are read after the walk above ends: one iterator at a time.
  for (StoredNode& child : node.children) {
    const std::string childPath =
        path.empty() ? child.name : path + (child.name.front() == '[' ? child.name : "/" + child.name);
    for (const auto& composite : composites) {
      if (composite.first == childPath) {
        ReadChildren(meta, ns, childPath, child, depth + 1);
        break;
      }
    }
  }
}

}  // namespace

std::vector<StoredNamespace> GetStoredNamespaces(XMPMetaRef xmp) {
  std::vector<StoredNamespace> namespaces;
  if (!xmp) return namespaces;
  try {
    const XMPMeta meta(xmp);
    XMPIterator schemas(meta, ovraxmp::kXMP_IterJustChildren);
    std::string ns, path, value;
    ovraxmp::XMP_OptionBits options = 0;
    while (schemas.Next(&ns, &path, &value, &options)) {
      auto prefix = ns.empty() ? std::nullopt : XMPMeta::GetNamespacePrefix(ns);
      if (!prefix) continue;
      if (!prefix->empty() && prefix->back() == ':') prefix->pop_back();
      namespaces.push_back({ns, *prefix});
    }
  } catch (...) {
    // A packet the toolkit cannot walk stores nothing that can be shown.
  }
  return namespaces;
}

std::vector<StoredNode> GetStoredNodes(XMPMetaRef xmp, const UTF8String& namespaceURI) {
  StoredNode root;
  if (!xmp) return root.children;
  try {
    ReadChildren(XMPMeta(xmp), namespaceURI, std::string(), root, 0);
  } catch (...) {
    // What was read before the toolkit failed is still worth showing.
  }
  return std::move(root.children);
}

}  // namespace ovrametadata
