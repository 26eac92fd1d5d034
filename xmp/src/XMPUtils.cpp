// Array text, templates, appending, subtree copies and removal.
#include <algorithm>
#include <cstring>
#include <set>
#include <string>
#include <vector>

#include <ovraxmp/XMPUtils.h>

#include "XMPNodeTree.h"
#include "XMPPacket.h"

namespace ovraxmp {
namespace {

bool IsBlank(char c) { return c == ' ' || c == '\t'; }

XMPMeta& RequireMeta(XMPMeta* meta) {
  if (!meta) detail::Throw(kXMPErr_BadParam, "no XMP object");
  detail::Require(meta->GetInternalRef());
  return *meta;
}

struct InternalEntry {
  const char* ns;
  const char* name;  // nullptr: the whole namespace
};

// Properties that applications own rather than users.
const InternalEntry kInternal[] = {
    {kXMP_NS_XMP_MM, nullptr},
    {kXMP_NS_Transient, nullptr},
    {kXMP_NS_XMP, "BaseURL"},
    {kXMP_NS_XMP, "CreatorTool"},
    {kXMP_NS_XMP, "Format"},
    {kXMP_NS_XMP, "Locale"},
    {kXMP_NS_XMP, "MetadataDate"},
    {kXMP_NS_XMP, "ModifyDate"},
    {kXMP_NS_DC, "format"},
    {kXMP_NS_DC, "language"},
    {kXMP_NS_Photoshop, "ICCProfile"},
    {kXMP_NS_Photoshop, "ColorMode"},
};

}  // namespace

bool XMPUtils::IsInternalProperty(const std::string& schemaNS, const std::string& propName) {
  const std::string name = detail::NormalizedPath(schemaNS, propName);
  for (const InternalEntry& entry : kInternal) {
    if (schemaNS != entry.ns) continue;
    if (!entry.name || name == entry.name) return true;
  }
  // Technical image data, except the few fields people write.
  if (schemaNS == kXMP_NS_TIFF) return name != "Artist" && name != "Copyright" && name != "ImageDescription";
  if (schemaNS == kXMP_NS_EXIF) return name != "UserComment";
  return false;
}

// ---- array text ----

std::string XMPUtils::CatenateArrayItems(const XMPMeta& xmpObj, const std::string& schemaNS,
                                         const std::string& arrayName, const std::string& separator,
                                         const std::string& quotes, XMP_OptionBits options) {
  detail::Require(xmpObj.GetInternalRef());
  const char open = quotes.empty() ? '"' : quotes[0];
  const char close = quotes.size() > 1 ? quotes[1] : open;
  const auto array = xmpObj.GetProperty(schemaNS, arrayName);
  if (!array) return std::string();
  const XMP_OptionBits form = array->options;
  if (!(form & kXMP_PropValueIsArray) || (form & kXMP_PropArrayIsAlternate))
    detail::Throw(kXMPErr_BadParam, "\"" + arrayName + "\" is not an unordered or ordered array");
  std::string special = ";";
  if (options & kXMPUtil_AllowCommas) special += ',';
  for (char c : separator)
    if (!IsBlank(c)) special += c;
  special += open;
  special += close;
  const XMP_Index count = xmpObj.CountArrayItems(schemaNS, arrayName);
  std::string out;
  for (XMP_Index i = 1; i <= count; ++i) {
    const XMP_Node node = xmpObj.GetArrayItem(schemaNS, arrayName, i).value_or(XMP_Node());
    const std::string& item = node.value;
    if (node.options & kXMP_PropCompositeMask) detail::Throw(kXMPErr_BadParam, "array items must be simple");
    if (i > 1) out += separator;
    const bool quote = item.empty() || IsBlank(item.front()) || IsBlank(item.back()) ||
                       item.find_first_of(special) != std::string::npos;
    if (!quote) {
      out += item;
      continue;
    }
    out += open;
    for (char c : item) {
      out += c;
      if (c == open || c == close) out += c;
    }
    out += close;
  }
  return out;
}

void XMPUtils::SeparateArrayItems(XMPMeta* xmpObj, const std::string& schemaNS, const std::string& arrayName,
                                  XMP_OptionBits options, const std::string& catedStr) {
  XMPMeta& meta = RequireMeta(xmpObj);
  detail::RequirePrefix(schemaNS);
  const bool commas = (options & kXMPUtil_AllowCommas) != 0;
  const auto isSeparator = [&](char c) { return c == ';' || (commas && c == ','); };
  std::vector<std::string> items;
  std::size_t pos = 0;
  const std::size_t size = catedStr.size();
  while (pos < size) {
    while (pos < size && (IsBlank(catedStr[pos]) || isSeparator(catedStr[pos]))) ++pos;
    if (pos >= size) break;
    std::string item;
    if (catedStr[pos] == '"') {
      ++pos;
      while (pos < size) {
        if (catedStr[pos] == '"') {
          if (pos + 1 < size && catedStr[pos + 1] == '"') {
            item += '"';
            pos += 2;
            continue;
          }
          ++pos;
          break;
        }
        item += catedStr[pos++];
      }
      // Text after the closing quote, up to the separator, still belongs.
      std::string tail;
      while (pos < size && !isSeparator(catedStr[pos])) tail += catedStr[pos++];
      while (!tail.empty() && IsBlank(tail.back())) tail.pop_back();
      std::size_t lead = 0;
      while (lead < tail.size() && IsBlank(tail[lead])) ++lead;
      item += tail.substr(lead);
    } else {
      while (pos < size && !isSeparator(catedStr[pos])) item += catedStr[pos++];
      while (!item.empty() && IsBlank(item.back())) item.pop_back();
    }
    items.push_back(std::move(item));
  }

  XMP_OptionBits form = 0;
  if (const auto array = meta.GetProperty(schemaNS, arrayName)) {
    form = array->options;
    if (!(form & kXMP_PropValueIsArray) || (form & kXMP_PropArrayIsAlternate))
      detail::Throw(kXMPErr_BadXPath, "\"" + arrayName + "\" is not an unordered or ordered array");
    for (XMP_Index i = meta.CountArrayItems(schemaNS, arrayName); i >= 1; --i)
      meta.DeleteArrayItem(schemaNS, arrayName, i);
  } else {
    form = kXMP_PropValueIsArray | (options & kXMP_PropArrayIsOrdered);
    meta.SetProperty(schemaNS, arrayName, std::string(), form);
  }
  for (const std::string& item : items) meta.AppendArrayItem(schemaNS, arrayName, 0, item, 0);
}

// ---- templates, appending, copies, removal ----

void XMPUtils::ApplyTemplate(XMPMeta* workingXMP, const XMPMeta& templateXMP, XMP_OptionBits actions) {
  XMPMeta& working = RequireMeta(workingXMP);
  detail::Require(templateXMP.GetInternalRef());
  const bool includeInternal = (actions & kXMPTemplate_IncludeInternalProperties) != 0;
  const bool clear = (actions & kXMPTemplate_ClearUnnamedProperties) != 0;
  const bool add = (actions & kXMPTemplate_AddNewProperties) != 0;
  const bool deleteEmpty = (actions & kXMPTemplate_ReplaceWithDeleteEmpty) != 0;
  const bool replace = deleteEmpty || (actions & kXMPTemplate_ReplaceExistingProperties) != 0;
  const auto considered = [&](const detail::TopLevel& p) {
    return p.ns != kXMP_NS_Transient && (includeInternal || !IsInternalProperty(p.ns, p.name));
  };

  if (clear) {
    for (const detail::TopLevel& p : detail::TopLevelProperties(working)) {
      if (considered(p) && !templateXMP.DoesPropertyExist(p.ns, p.name)) working.DeleteProperty(p.ns, p.name);
    }
  }
  if (!add && !replace) return;
  for (const detail::TopLevel& p : detail::TopLevelProperties(templateXMP)) {
    if (!considered(p)) continue;
    detail::Node node;
    if (!detail::ReadNode(templateXMP, p.ns, p.name, &node)) continue;
    const bool exists = working.DoesPropertyExist(p.ns, p.name);
    if (exists) {
      if (!replace) continue;
      if (deleteEmpty && detail::IsEmptyNode(node)) {
        working.DeleteProperty(p.ns, p.name);
        continue;
      }
      detail::WriteNode(working, p.ns, p.name, node);
    } else if (add && !(deleteEmpty && detail::IsEmptyNode(node))) {
      detail::WriteNode(working, p.ns, p.name, node);
    }
  }
}

namespace {

// Adds what source has and dest lacks below one node.
void MergeNode(XMPMeta& dest, const std::string& ns, const std::string& path, const detail::Node& source) {
  detail::Node current;
  if (!detail::ReadNode(dest, ns, path, &current)) {
    detail::WriteNode(dest, ns, path, source);
    return;
  }
  const XMP_OptionBits composite = kXMP_PropCompositeMask;
  if ((current.options & composite) == 0 || (current.options & composite) != (source.options & composite)) return;
  if (source.options & kXMP_PropValueIsStruct) {
    for (const detail::Node& field : source.children) MergeNode(dest, ns, path + "/" + field.name, field);
    return;
  }
  if (source.options & kXMP_PropArrayIsAltText) {
    const auto langOf = [](const detail::Node& item) {
      for (const detail::Node& q : item.qualifiers)
        if (q.name == "xml:lang") return q.value;
      return std::string();
    };
    std::set<std::string> have;
    for (const detail::Node& item : current.children) have.insert(langOf(item));
    for (const detail::Node& item : source.children) {
      const std::string lang = langOf(item);
      if (lang.empty() || have.count(lang)) continue;
      dest.SetLocalizedText(ns, path, std::string(), lang, item.value);
      have.insert(lang);
    }
    return;
  }
  std::set<std::string> have;
  for (const detail::Node& item : current.children) have.insert(detail::Canonical(item));
  XMP_Index count = static_cast<XMP_Index>(current.children.size());
  for (const detail::Node& item : source.children) {
    if (!have.insert(detail::Canonical(item)).second) continue;
    if (item.options & kXMP_PropCompositeMask) {
      dest.AppendArrayItem(ns, path, 0, std::string(), item.options & kXMP_PropCompositeMask);
      ++count;
      detail::Node copy = item;
      const std::string itemPath = path + "[" + std::to_string(count) + "]";
      for (const detail::Node& field : copy.children) detail::WriteNode(dest, ns, detail::ChildPath(itemPath, field), field);
    } else {
      dest.AppendArrayItem(ns, path, 0, item.value, item.options & kXMP_PropValueIsURI);
      ++count;
    }
  }
}

}  // namespace

void XMPUtils::AppendProperties(const XMPMeta& source, XMPMeta* destPtr, XMP_OptionBits options) {
  XMPMeta& dest = RequireMeta(destPtr);
  detail::Require(source.GetInternalRef());
  const bool all = (options & kXMPUtil_DoAllProperties) != 0;
  const bool replace = (options & kXMPUtil_ReplaceOldValues) != 0;
  const bool deleteEmpty = (options & kXMPUtil_DeleteEmptyValues) != 0;
  for (const detail::TopLevel& p : detail::TopLevelProperties(source)) {
    if (!all && IsInternalProperty(p.ns, p.name)) continue;
    detail::Node node;
    if (!detail::ReadNode(source, p.ns, p.name, &node)) continue;
    if (deleteEmpty && detail::IsEmptyNode(node)) {
      dest.DeleteProperty(p.ns, p.name);
      continue;
    }
    if (replace || !dest.DoesPropertyExist(p.ns, p.name)) {
      detail::WriteNode(dest, p.ns, p.name, node);
    } else {
      MergeNode(dest, p.ns, p.name, node);
    }
  }
}

void XMPUtils::DuplicateSubtree(const XMPMeta& source, XMPMeta* destPtr, const std::string& sourceNS,
                                const std::string& sourceRoot, const std::string& destNS,
                                const std::string& destRoot, XMP_OptionBits) {
  XMPMeta& dest = RequireMeta(destPtr);
  detail::Require(source.GetInternalRef());
  detail::RequirePrefix(sourceNS);
  const std::string targetNS = destNS.empty() ? sourceNS : destNS;
  detail::RequirePrefix(targetNS);
  if (sourceRoot.empty()) {
    if (!destRoot.empty()) detail::Throw(kXMPErr_BadParam, "a whole namespace copies to a namespace");
    for (const detail::TopLevel& p : detail::TopLevelProperties(source, sourceNS)) {
      detail::Node node;
      if (detail::ReadNode(source, p.ns, p.name, &node))
        detail::WriteNode(dest, targetNS, detail::NormalizedPath(sourceNS, p.name), node);
    }
    return;
  }
  detail::Node node;
  if (!detail::ReadNode(source, sourceNS, sourceRoot, &node))
    detail::Throw(kXMPErr_BadXPath, "source subtree \"" + sourceRoot + "\" does not exist");
  const std::string targetRoot = destRoot.empty() ? detail::NormalizedPath(sourceNS, sourceRoot) : destRoot;
  if (source.GetInternalRef() == dest.GetInternalRef() && targetNS == sourceNS &&
      detail::NormalizedPath(sourceNS, sourceRoot) == detail::NormalizedPath(targetNS, targetRoot))
    return;
  detail::WriteNode(dest, targetNS, targetRoot, node);
}

void XMPUtils::RemoveProperties(XMPMeta* xmpObj, const std::string& schemaNS, const std::string& propName,
                                XMP_OptionBits options) {
  XMPMeta& meta = RequireMeta(xmpObj);
  const bool all = (options & kXMPUtil_DoAllProperties) != 0;
  if (!propName.empty()) {
    if (schemaNS.empty()) detail::Throw(kXMPErr_BadSchema, "a property needs its namespace");
    if (all || !IsInternalProperty(schemaNS, propName)) meta.DeleteProperty(schemaNS, propName);
    return;
  }
  if (!schemaNS.empty() && !detail::NamespaceKnown(schemaNS)) return;
  for (const detail::TopLevel& p : detail::TopLevelProperties(meta, schemaNS)) {
    if (all || !IsInternalProperty(p.ns, p.name)) meta.DeleteProperty(p.ns, p.name);
  }
}

}  // namespace ovraxmp
