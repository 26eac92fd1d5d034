// Several files seen as one: collecting packets into an aggregate that marks
// differing values, and distributing an edited aggregate back.
#include <algorithm>
#include <map>
#include <string>
#include <utility>

#include <ovraxmp/XMPUtils.h>

#include "XMPNodeTree.h"
#include "XMPPacket.h"

namespace ovraxmp {
namespace {

const char kMultiFileCount[] = "MultiFileCount";
const char kDeletedProperties[] = "DeletedProperties";

using Key = std::pair<std::string, std::string>;  // namespace, normalised name

struct Property {
  std::string name;          // "prefix:name"
  const std::string* text;   // see PropertyText, kept by the packet
};

std::map<Key, Property> PropertiesByKey(const XMPMeta& meta) {
  std::map<Key, Property> result;
  for (const detail::PropertyText& p : detail::CachedTexts(meta)) {
    if (p.key.ns == kXMP_NS_Transient) continue;
    result.emplace(Key(p.key.ns, detail::NormalizedPath(p.key.ns, p.key.name)), Property{p.key.name, &p.text});
  }
  return result;
}

const detail::Node* FindChild(const detail::Node& node, const detail::Node& like) {
  for (const detail::Node& child : node.children)
    if (child.ns == like.ns && child.name == like.name) return &child;
  return nullptr;
}

bool IsStruct(const detail::Node& node) { return (node.options & kXMP_PropValueIsStruct) != 0; }

// Marks the differences below two nodes at the same path of the aggregate.
void Compare(XMPMeta& target, const std::string& ns, const std::string& path, const detail::Node& have,
             const detail::Node& incoming) {
  if (target.IsMultiValued(ns, path)) return;
  if (IsStruct(have) && IsStruct(incoming)) {
    for (const detail::Node& field : have.children) {
      const std::string fieldPath = path + "/" + field.name;
      const detail::Node* other = FindChild(incoming, field);
      if (!other)
        target.SetMultiValued(ns, fieldPath);
      else
        Compare(target, ns, fieldPath, field, *other);
    }
    for (const detail::Node& field : incoming.children) {
      if (!FindChild(have, field)) target.SetMultiValued(ns, path + "/" + field.name);
    }
    return;
  }
  if (detail::Canonical(have) != detail::Canonical(incoming)) target.SetMultiValued(ns, path);
}

bool HasMarkBelow(const XMPPacket& packet, const std::string& ns, const std::string& path) {
  const auto found = packet.Marks().find(ns);
  if (found == packet.Marks().end()) return false;
  const std::string normal = detail::NormalizedPath(ns, path) + "/";
  const auto it = found->second.lower_bound(normal);
  return it != found->second.end() && it->compare(0, normal.size(), normal) == 0;
}

std::string Language(const detail::Node& item) {
  for (const detail::Node& qualifier : item.qualifiers)
    if (qualifier.name == "xml:lang") return qualifier.value;
  return std::string();
}

// A language alternative passes on only the languages the edit changed:
// each member keeps its other languages, which the aggregate holds only
// from the first member that had the property.
void DistributeLanguages(const XMPPacket& packet, XMPMeta& member, const std::string& ns, const std::string& path,
                         const detail::Node& node) {
  if (!packet.Baseline()) return;  // nothing was edited
  const detail::BorrowedPacket baseline(packet.Baseline());
  const XMPMeta& before = baseline.Meta();
  detail::Node old;
  detail::ReadNode(before, ns, path, &old);
  if (const auto stored = member.GetProperty(ns, path); stored && !(stored->options & kXMP_PropArrayIsAltText)) return;
  for (const detail::Node& item : node.children) {
    const std::string language = Language(item);
    const auto same = std::find_if(old.children.begin(), old.children.end(), [&](const detail::Node& o) {
      return Language(o) == language && o.value == item.value;
    });
    if (!language.empty() && same == old.children.end())
      member.SetLocalizedText(ns, path, std::string(), language, item.value);
  }
  for (const detail::Node& item : old.children) {
    const std::string language = Language(item);
    const bool kept = std::any_of(node.children.begin(), node.children.end(),
                                  [&](const detail::Node& n) { return Language(n) == language; });
    if (!kept && !language.empty()) member.DeleteLocalizedText(ns, path, std::string(), language);
  }
}

void DistributeNode(const XMPMeta& aggregate, const XMPPacket& packet, XMPMeta& member, const std::string& ns,
                    const std::string& path, const detail::Node& node) {
  if (aggregate.IsMultiValued(ns, path)) return;
  if (node.options & kXMP_PropArrayIsAltText) {
    DistributeLanguages(packet, member, ns, path, node);
    return;
  }
  if (!IsStruct(node) || !HasMarkBelow(packet, ns, path)) {
    detail::WriteNode(member, ns, path, node);
    return;
  }
  const auto existing = member.GetProperty(ns, path);
  if (!existing || !(existing->options & kXMP_PropValueIsStruct)) {
    member.DeleteProperty(ns, path);
    member.SetProperty(ns, path, std::string(), kXMP_PropValueIsStruct);
  }
  for (const detail::Node& field : node.children)
    DistributeNode(aggregate, packet, member, ns, path + "/" + field.name, field);
}

}  // namespace

void XMPUtils::MultiFileCollect(XMPMeta* targetPtr, const XMPMeta& source, XMP_OptionBits) {
  if (!targetPtr) detail::Throw(kXMPErr_BadParam, "no XMP object");
  XMPMeta& target = *targetPtr;
  // Collecting builds the aggregate; only what is edited afterwards counts
  // as a change.
  detail::Require(target.GetInternalRef()).TrackChanges(XMPPacket::Tracking::kNone);
  detail::Require(source.GetInternalRef());
  const auto counted = target.GetProperty(kXMP_NS_Transient, kMultiFileCount);
  if (!counted) {
    for (const auto& entry : PropertiesByKey(source)) {
      detail::Node node;
      if (detail::ReadNode(source, entry.first.first, entry.second.name, &node))
        detail::WriteNode(target, entry.first.first, entry.first.second, node);
    }
    target.SetProperty(kXMP_NS_Transient, kMultiFileCount, "1");
    detail::Require(target.GetInternalRef()).TrackChanges(XMPPacket::Tracking::kPacket);
    return;
  }
  std::int64_t count = 1;
  try {
    count = ConvertToInt64(counted->value);
  } catch (const XMP_Error&) {
    // A foreign value in our own counter: restart the count, keep collecting.
  }
  target.SetProperty(kXMP_NS_Transient, kMultiFileCount, ConvertFromInt64(count + 1));

  const std::map<Key, Property> have = PropertiesByKey(target);
  const std::map<Key, Property> incoming = PropertiesByKey(source);
  for (const auto& entry : have) {
    const std::string& ns = entry.first.first;
    const std::string& name = entry.first.second;
    if (target.IsMultiValued(ns, name)) continue;
    const auto other = incoming.find(entry.first);
    if (other == incoming.end()) {
      target.SetMultiValued(ns, name);
      continue;
    }
    if (*other->second.text == *entry.second.text) continue;  // the same to the last qualifier
    detail::Node mine, theirs;
    detail::ReadNode(target, ns, entry.second.name, &mine);
    detail::ReadNode(source, ns, other->second.name, &theirs);
    Compare(target, ns, name, mine, theirs);
  }
  for (const auto& entry : incoming) {
    if (!have.count(entry.first)) target.SetMultiValued(entry.first.first, entry.first.second);
  }
  detail::Require(target.GetInternalRef()).TrackChanges(XMPPacket::Tracking::kPacket);
}

void XMPUtils::MultiFileDistribute(const XMPMeta& aggregate, XMPMeta* memberPtr, XMP_OptionBits) {
  if (!memberPtr) detail::Throw(kXMPErr_BadParam, "no XMP object");
  XMPMeta& member = *memberPtr;
  detail::Require(member.GetInternalRef());
  const XMPPacket& packet = detail::Require(aggregate.GetInternalRef());
  const std::map<Key, Property> has = PropertiesByKey(member);
  for (const auto& entry : PropertiesByKey(aggregate)) {
    // A property the member holds as it is needs nothing.
    const auto same = has.find(entry.first);
    if (same != has.end() && *same->second.text == *entry.second.text) continue;
    if (aggregate.IsMultiValued(entry.first.first, entry.first.second)) continue;
    detail::Node node;
    if (detail::ReadNode(aggregate, entry.first.first, entry.second.name, &node))
      DistributeNode(aggregate, packet, member, entry.first.first, entry.first.second, node);
  }
  // The deletion records: "prefix:path" of each deleted property.
  const XMP_Index records = aggregate.CountArrayItems(kXMP_NS_Transient, kDeletedProperties);
  for (XMP_Index i = 1; i <= records; ++i) {
    const std::string item = ComposeArrayItemPath(kXMP_NS_Transient, kDeletedProperties, i);
    const auto record = aggregate.GetProperty(kXMP_NS_Transient, item);
    if (!record || !(record->options & kXMP_PropValueIsStruct)) continue;
    const auto uriField = aggregate.GetStructField(kXMP_NS_Transient, item, kXMP_NS_Transient, "DelURI");
    const auto pathField = aggregate.GetStructField(kXMP_NS_Transient, item, kXMP_NS_Transient, "DelPath");
    if (!uriField || !pathField || uriField->value.empty() || pathField->value.empty()) continue;
    const std::string& uri = uriField->value;
    const std::string& path = pathField->value;
    const auto registered = XMPMeta::GetNamespacePrefix(uri);
    if (!registered) continue;
    const std::string& prefix = *registered;
    // Only records whose path starts with the namespace's own prefix.
    if (path.compare(0, prefix.size(), prefix) != 0) continue;
    if (member.DoesPropertyExist(uri, path)) member.DeleteProperty(uri, path);
  }
}

}  // namespace ovraxmp
