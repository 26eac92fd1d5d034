// Path composition and the in-memory multi-value marks.
#include <string>

#include <ovraxmp/XMPMeta.h>
#include <ovraxmp/XMPUtils.h>

#include "XMPPacket.h"

namespace ovraxmp {
namespace {

void RequireName(const std::string& name, const char* what) {
  if (name.empty()) detail::Throw(kXMPErr_BadXPath, std::string("empty ") + what);
}

}  // namespace

std::string XMPUtils::ComposeArrayItemPath(const std::string& schemaNS, const std::string& arrayName,
                                           XMP_Index itemIndex) {
  detail::RequirePrefix(schemaNS);
  RequireName(arrayName, "array name");
  if (itemIndex == kXMP_ArrayLastItem) return arrayName + "[last()]";
  if (itemIndex <= 0) detail::Throw(kXMPErr_BadIndex, "array index " + std::to_string(itemIndex));
  return arrayName + "[" + std::to_string(itemIndex) + "]";
}

std::string XMPUtils::ComposeStructFieldPath(const std::string& schemaNS, const std::string& structName,
                                             const std::string& fieldNS, const std::string& fieldName) {
  detail::RequirePrefix(schemaNS);
  RequireName(structName, "structure name");
  RequireName(fieldName, "field name");
  const std::string prefix = detail::RequirePrefix(fieldNS);
  return structName + "/" + prefix + fieldName;
}

std::string XMPUtils::ComposeQualifierPath(const std::string& schemaNS, const std::string& propName,
                                           const std::string& qualNS, const std::string& qualName) {
  detail::RequirePrefix(schemaNS);
  RequireName(propName, "property name");
  RequireName(qualName, "qualifier name");
  const std::string prefix = detail::RequirePrefix(qualNS);
  return propName + "/?" + prefix + qualName;
}

bool XMPMeta::IsMultiValued(const std::string& ns, const std::string& path) const {
  XMPPacket& packet = detail::Require(mRef);
  if (packet.Marks().empty()) return false;
  const auto found = packet.Marks().find(ns);
  if (found == packet.Marks().end() || found->second.empty()) return false;
  const std::set<std::string>& marks = found->second;
  const std::string normal = detail::NormalizedPath(ns, path);
  if (marks.count(normal)) return true;
  bool hit = false;
  detail::ForEachAncestor(normal, [&](std::size_t end) {
    hit = marks.count(normal.substr(0, end)) > 0;
    return hit;
  });
  return hit;
}

void XMPMeta::SetMultiValued(const std::string& ns, const std::string& path) {
  XMPPacket& packet = detail::Require(mRef);
  if (ns.empty() || path.empty()) detail::Throw(kXMPErr_BadParam, "empty namespace or path");
  packet.Marks()[ns].insert(detail::NormalizedPath(ns, path));
}

void XMPMeta::ClearMultiValueInfo(const std::string& ns, const std::string& path) {
  XMPPacket& packet = detail::Require(mRef);
  const auto found = packet.Marks().find(ns);
  if (found == packet.Marks().end()) return;
  if (path.empty()) {
    packet.Marks().erase(found);
    return;
  }
  std::set<std::string>& marks = found->second;
  const std::string normal = detail::NormalizedPath(ns, path);
  for (auto it = marks.lower_bound(normal); it != marks.end() && it->compare(0, normal.size(), normal) == 0;) {
    const bool descendant = it->size() == normal.size() || (*it)[normal.size()] == '/' || (*it)[normal.size()] == '[';
    it = descendant ? marks.erase(it) : std::next(it);
  }
  if (marks.empty()) packet.Marks().erase(found);
}

}  // namespace ovraxmp
