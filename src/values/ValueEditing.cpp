// Presence, deletion (with the deletion records of aggregate packets),
// array items, templates and the minimal float write.
#include <ovrametadata/ValueEditing.h>

#include <cmath>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include <ovracore/Localizer.h>
#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Providers.h>

#include "values/ValuesInternal.h"

namespace ovrametadata {

namespace {

constexpr const char kMultiFileCount[] = "MultiFileCount";
constexpr const char kDeletedProperties[] = "DeletedProperties";
constexpr const char kDelURI[] = "DelURI";
constexpr const char kDelPath[] = "DelPath";

// The 1-based toolkit index of a 0-based index; the last-item marker passes.
ovraxmp::XMP_Index ToolkitIndex(int index) {
  return index == ovraxmp::kXMP_ArrayLastItem ? ovraxmp::kXMP_ArrayLastItem : index + 1;
}

// Writes the empty text as a simple value with the usual compare, write and
// verify steps; answers whether it wrote.
bool WriteEmptySimpleText(ovraxmp::XMPMeta& meta, const Path& path) {
  const std::string& ns = path.namespaceURI;
  const std::string& name = path.description;
  bool written = false;
  try {
    const auto old = meta.GetProperty(ns, name);
    const bool multiValued = meta.IsMultiValued(ns, name);
    const bool differs = old && !old->value.empty();
    if (!multiValued && !differs) return false;
    meta.SetProperty(ns, name, std::string());
    written = true;
    const auto readBack = meta.GetProperty(ns, name);
    if (!readBack || !readBack->value.empty()) {
      ReportInvalidData(kErrorWritingXMP, path);
    }
    if (multiValued) meta.ClearMultiValueInfo(ns, name);
  } catch (...) {
    ReportInvalidData(kErrorWritingXMP, path);
  }
  return written;
}

// Removes the structures on the branch of deletedPath that the deletion
// left without any simple value below them. Answers whether the node at
// nodePath (the schema root when empty) holds no simple value.
bool RemoveEmptiedStructures(ovraxmp::XMPMeta& meta, const std::string& ns,
                             const std::string& nodePath, bool nodeIsArray,
                             const std::string& deletedPath) {
  std::vector<std::pair<std::string, ovraxmp::XMP_OptionBits>> children;
  {
    ovraxmp::XMPIterator it(meta, ns, nodePath, ovraxmp::kXMP_IterJustChildren);
    std::string childNS, childPath, value;
    ovraxmp::XMP_OptionBits options = 0;
    while (it.Next(&childNS, &childPath, &value, &options)) {
      if (childPath.empty() || childPath == nodePath) continue;
      children.emplace_back(childPath, options);
    }
  }
  bool metSimpleValue = false;
  for (const auto& child : children) {
    if ((child.second & ovraxmp::kXMP_PropCompositeMask) == 0) {
      metSimpleValue = true;
      continue;
    }
    if (deletedPath.find(child.first) == std::string::npos) continue;
    const bool childIsArray = (child.second & ovraxmp::kXMP_PropValueIsArray) != 0;
    const bool childEmpty = RemoveEmptiedStructures(meta, ns, child.first, childIsArray, deletedPath);
    // Arrays keep their emptied items so that item indices stay stable.
    if (!childEmpty || nodeIsArray) return false;
    meta.DeleteProperty(ns, child.first);
  }
  return !metSimpleValue;
}

boost::shared_ptr<TypeDefinition> ItemTypeOfArray(const Path& path) {
  boost::shared_ptr<TypeDefinition> type = TypeEntryDefinition(path);
  if (type && !type->fields.empty()) return type;
  // Arrays of ordinary properties resolve to the array type itself; their
  // element type says whether the items are structures.
  if (const boost::shared_ptr<EntryDefinition> entry = PathEntryDefinition(path)) {
    if (const boost::shared_ptr<TypeDefinition> element = PropertyTypeOf(*entry)) return element;
  }
  return type;
}

}  // namespace

// ---------------------------------------------------------------------------
// Presence and deletion

bool HasValue(XMPMetaRef xmp, const Path& path) {
  if (!xmp) return false;
  try {
    return ovraxmp::XMPMeta(xmp).DoesPropertyExist(path.namespaceURI, path.description);
  } catch (...) {
    ReportInvalidData(kErrorReadingXMP, path);
    return false;
  }
}

void MarkMultiValueDeleted(XMPMetaRef xmp, const Path& path) {
  if (!xmp) return;
  const std::string transient(ovraxmp::kXMP_NS_Transient);
  try {
    ovraxmp::XMPMeta meta(xmp);
    if (!meta.DoesPropertyExist(transient, kMultiFileCount)) return;
    if (!meta.DoesPropertyExist(transient, kDeletedProperties)) {
      meta.SetProperty(transient, kDeletedProperties, std::string(),
                       ovraxmp::kXMP_PropArrayIsUnordered);
    }
    meta.AppendArrayItem(transient, kDeletedProperties, ovraxmp::kXMP_PropArrayIsUnordered,
                         std::string(), ovraxmp::kXMP_PropValueIsStruct);
    const std::string itemPath =
        ovraxmp::XMPUtils::ComposeArrayItemPath(transient, kDeletedProperties, ovraxmp::kXMP_ArrayLastItem);
    meta.SetStructField(transient, itemPath, transient, kDelURI, path.namespaceURI);
    const auto prefix = ovraxmp::XMPMeta::GetNamespacePrefix(path.namespaceURI);
    if (!prefix) throw ovraxmp::XMP_Error(ovraxmp::kXMPErr_BadSchema, "unregistered namespace");
    meta.SetStructField(transient, itemPath, transient, kDelPath, *prefix + path.description);
  } catch (...) {
    ReportInvalidData(kErrorReadingXMP, path);
  }
}

bool DeleteValue(XMPMetaRef xmp, const Path& path) {
  if (!xmp) return false;
  const std::string& ns = path.namespaceURI;
  try {
    ovraxmp::XMPMeta meta(xmp);
    if (meta.IsMultiValued(ns, path.description)) {
      // The value stays: the aggregate provider deletes the per-file values
      // from the record.
      meta.ClearMultiValueInfo(ns, path.description);
      MarkMultiValueDeleted(xmp, path);
      return true;
    }
    if (!HasValue(xmp, path)) return false;
    const boost::shared_ptr<TypeDefinition> parentType = TypeIdDefinition(path.parent_id);
    if (parentType && IsArrayType(*parentType)) return WriteEmptySimpleText(meta, path);
    meta.DeleteProperty(ns, path.description);
    if (parentType && !parentType->fields.empty()) {
      if (const auto prefix = ovraxmp::XMPMeta::GetNamespacePrefix(ns)) {
        // The toolkit's prefix carries its colon, as the iterator's paths do.
        RemoveEmptiedStructures(meta, ns, std::string(), false, *prefix + path.description);
      }
    }
    MarkMultiValueDeleted(xmp, path);
    return true;
  } catch (...) {
    ReportInvalidData(kErrorWritingXMP, path);
    return false;
  }
}

// ---------------------------------------------------------------------------
// Arrays

int CountArrayItems(XMPMetaRef xmp, const Path& path) {
  if (!xmp || !IsPathAnArray(path, true)) return 0;
  try {
    const ovraxmp::XMPMeta meta(xmp);
    if (!meta.DoesPropertyExist(path.namespaceURI, path.description)) return 0;
    return meta.CountArrayItems(path.namespaceURI, path.description);
  } catch (const ovraxmp::XMP_Error&) {
    ReportInvalidData(kErrorReadingXMP, path);
    return 0;
  }
}

bool AddArrayItem(XMPMetaRef xmp, const Path& path, int index) {
  if (!xmp || !IsPathAnArray(path, true)) return false;
  const std::string& ns = path.namespaceURI;
  const std::string& arrayName = path.entry_name;
  try {
    const boost::shared_ptr<TypeDefinition> itemType = ItemTypeOfArray(path);
    const ovraxmp::XMP_OptionBits itemOptions =
        itemType && !itemType->fields.empty() ? ovraxmp::kXMP_PropValueIsStruct : 0;
    ovraxmp::XMPMeta meta(xmp);
    const bool exists = meta.DoesPropertyExist(ns, arrayName);
    if (exists && meta.CountArrayItems(ns, arrayName) > 0) {
      meta.SetArrayItem(ns, arrayName, ToolkitIndex(index), std::string(),
                        itemOptions | ovraxmp::kXMP_InsertBeforeItem);
      return true;
    }
    const boost::optional<PrimitiveType> primitive = PrimitiveTypeOfPath(path);
    // An empty array of unknown type gets nothing, and that is no failure.
    if (!primitive) return true;
    const ovraxmp::XMP_OptionBits arrayOptions = *primitive == kPrimitiveType_seq
                                                     ? ovraxmp::kXMP_PropArrayIsOrdered
                                                     : ovraxmp::kXMP_PropArrayIsUnordered;
    meta.AppendArrayItem(ns, arrayName, arrayOptions, std::string(), itemOptions);
    return true;
  } catch (const ovraxmp::XMP_Error&) {
    ReportInvalidData(kErrorWritingXMP, path);
    return false;
  }
}

bool DeleteArrayItem(XMPMetaRef xmp, const Path& path, int index) {
  if (!xmp || !IsPathAnArray(path, true)) return false;
  const std::string& ns = path.namespaceURI;
  const std::string& arrayName = path.entry_name;
  try {
    ovraxmp::XMPMeta meta(xmp);
    meta.DeleteArrayItem(ns, arrayName, ToolkitIndex(index));
    if (meta.DoesPropertyExist(ns, arrayName) && meta.CountArrayItems(ns, arrayName) == 0) {
      DeleteValue(xmp, path);
    }
    return true;
  } catch (const ovraxmp::XMP_Error&) {
    ReportInvalidData(kErrorWritingXMP, path);
    return false;
  }
}

// ---------------------------------------------------------------------------
// Templates

bool ApplyTemplate(XMPMetaRef destination, XMPMetaRef templateXMP, TemplateImportOptions options) {
  if (!destination || !templateXMP) return false;
  ovraxmp::XMP_OptionBits flags = ovraxmp::kXMPTemplate_NoOptions;
  switch (options) {
    case TemplateReplaceAll:
      flags = ovraxmp::kXMPTemplate_ClearUnnamedProperties |
              ovraxmp::kXMPTemplate_ReplaceExistingProperties;  // 0x12
      break;
    case TemplateClearUnnamed:
      flags = ovraxmp::kXMPTemplate_ClearUnnamedProperties;  // 0x02
      break;
    case TemplateReplaceDeleteEmpty:
      flags = ovraxmp::kXMPTemplate_ReplaceWithDeleteEmpty;  // 0x08
      break;
    default:
      break;
  }
  try {
    ovraxmp::XMPMeta working(destination);
    ovraxmp::XMPUtils::ApplyTemplate(&working, ovraxmp::XMPMeta(templateXMP), flags);
    return true;
  } catch (const ovraxmp::XMP_Error&) {
    SendError(kErrorWritingXMP,
              ovracore::ZString(
                  "$$$/ovrametadata/ErrorInXMPData/InvalidTemplate=template cannot be applied."),
              UTF16String());
    return false;
  }
}

// ---------------------------------------------------------------------------
// Copying

std::vector<Path> CopyValues(XMPMetaRef source, XMPMetaRef destination, const std::vector<Path>& paths) {
  std::vector<Path> changed;
  if (!source || !destination) return changed;
  const ovraxmp::XMPMeta from(source);
  ovraxmp::XMPMeta to(destination);
  for (const Path& path : paths) {
    const std::string& ns = path.namespaceURI;
    const std::string& name = path.description;
    try {
      if (!from.DoesPropertyExist(ns, name)) {
        // Deleted as any deletion is, so that an aggregate passes it on.
        if (DeleteValue(destination, path)) changed.push_back(path);
        continue;
      }
      // Compared as serialised subtrees: a copy of an equal value is no change.
      ovraxmp::XMPMeta before, after;
      if (to.DoesPropertyExist(ns, name)) ovraxmp::XMPUtils::DuplicateSubtree(to, &before, ns, name, ns, name);
      ovraxmp::XMPUtils::DuplicateSubtree(from, &after, ns, name, ns, name);
      constexpr auto kCompact = ovraxmp::kXMP_OmitPacketWrapper | ovraxmp::kXMP_UseCompactFormat;
      if (before.SerializeToBuffer(kCompact) == after.SerializeToBuffer(kCompact) && !to.IsMultiValued(ns, name))
        continue;
      to.DeleteProperty(ns, name);
      ovraxmp::XMPUtils::DuplicateSubtree(from, &to, ns, name, ns, name);
      to.ClearMultiValueInfo(ns, name);
      changed.push_back(path);
    } catch (...) {
      ReportInvalidData(kErrorWritingXMP, path);
    }
  }
  return changed;
}

// ---------------------------------------------------------------------------
// Minimal float

void SetMinimalFloatValue(const Value& value, double number) {
  const Path& path = value.path;
  try {
    MetaDataUpdateAccess access(value.provider);
    if (!*access) return;
    ovraxmp::XMPMeta meta(*access);
    const std::string& ns = path.namespaceURI;
    const std::string& name = path.description;
    const std::optional<double> current = meta.GetProperty_Float(ns, name);
    const bool multiValued = meta.IsMultiValued(ns, name);
    if (current && !multiValued && *current == number) return;
    char buffer[512];
    std::snprintf(buffer, sizeof buffer, "%1.*lg", 17, number);
    meta.SetProperty(ns, name, buffer);
    const std::optional<double> readBack = meta.GetProperty_Float(ns, name);
    if (!readBack || std::fabs(*readBack - number) >= 0.0001) {
      ReportInvalidData(kErrorWritingXMP, path);
    }
    if (multiValued) meta.ClearMultiValueInfo(ns, name);
    access.AddChange(path);
  } catch (...) {
    ReportInvalidData(kErrorWritingXMP, path);
  }
}

}  // namespace ovrametadata
