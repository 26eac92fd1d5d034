// ovraxmp: path composition, value conversions and whole-packet utilities.
#pragma once

#include <cstdint>
#include <string>

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPMeta.h>

namespace ovraxmp {

class XMPUtils {
 public:
  // ---- Path composition (the texts every path-taking call accepts) ----
  // "arrayName[i]", or "arrayName[last()]" for kXMP_ArrayLastItem; an index
  // of 0 or below -1 raises kXMPErr_BadIndex.
  static std::string ComposeArrayItemPath(const std::string& schemaNS, const std::string& arrayName,
                                          XMP_Index itemIndex);
  // "structName/prefix:fieldName"; an unregistered fieldNS raises
  // kXMPErr_BadSchema.
  static std::string ComposeStructFieldPath(const std::string& schemaNS, const std::string& structName,
                                            const std::string& fieldNS, const std::string& fieldName);
  // "propName/?prefix:qualName"; an unregistered qualNS raises kXMPErr_BadSchema.
  static std::string ComposeQualifierPath(const std::string& schemaNS, const std::string& propName,
                                          const std::string& qualNS, const std::string& qualName);

  // ---- Conversions; text that does not convert raises kXMPErr_BadValue ----
  static std::string ConvertFromBool(bool binValue);        // "True"/"False"
  static std::string ConvertFromInt(std::int32_t binValue);
  static std::string ConvertFromInt64(std::int64_t binValue);
  // printf-style format; empty means "%f".
  static std::string ConvertFromFloat(double binValue, const std::string& format);
  // ISO 8601 in the shortest form the record allows ("2024", "2024-03",
  // "2024-03-05", "2024-03-05T07:08", with seconds and fractions when not
  // zero, then "Z" or "+hh:mm" when the record has a zone).
  static std::string ConvertFromDate(const XMP_DateTime& binValue);
  // "true"/"false"/"t"/"f"/"1"/"0", any case, blanks around ignored.
  static bool ConvertToBool(const std::string& strValue);
  static std::int32_t ConvertToInt(const std::string& strValue);
  // Decimal, or hexadecimal after "0x"; blanks around ignored.
  static std::int64_t ConvertToInt64(const std::string& strValue);
  static double ConvertToFloat(const std::string& strValue);
  // Every ISO 8601 form XMP allows, also a time alone ("T07:08", "07:08:09Z").
  static XMP_DateTime ConvertToDate(const std::string& strValue);
  // Moves a time with a zone to UTC (sign 0); a time without zone is taken
  // as UTC already. Dates without time are left alone.
  static XMP_DateTime ConvertToUTCTime(XMP_DateTime time);
  // Moves a time with a zone to the machine's local zone.
  static XMP_DateTime ConvertToLocalTime(XMP_DateTime time);
  // Now, in the local zone, with the zone offset.
  static XMP_DateTime CurrentDateTime();

  // ---- Array text ----
  // Joins the items of a simple-item, non-alternate array with separator;
  // an item with a separator character, a quote, leading or trailing blanks
  // (or an empty item) is quoted, inner quotes doubled. quotes holds the
  // quote character (first) and optionally a different closing one; empty
  // means '"'. An absent array gives the empty string.
  static std::string CatenateArrayItems(const XMPMeta& xmpObj, const std::string& schemaNS,
                                        const std::string& arrayName, const std::string& separator,
                                        const std::string& quotes, XMP_OptionBits options);
  // Splits on ';' (and ',' with kXMPUtil_AllowCommas), trims blanks around
  // items, honours '"' quoting, and replaces the array's items in order. An
  // absent array is created with the form in options (kXMP_PropArrayIsOrdered
  // or unordered).
  static void SeparateArrayItems(XMPMeta* xmpObj, const std::string& schemaNS,
                                 const std::string& arrayName, XMP_OptionBits options,
                                 const std::string& catedStr);

  // ---- Whole-packet operations ----
  // kXMPTemplate_* flags; with none nothing changes.
  static void ApplyTemplate(XMPMeta* workingXMP, const XMPMeta& templateXMP, XMP_OptionBits actions);
  // kXMPUtil_DoAllProperties, kXMPUtil_ReplaceOldValues, kXMPUtil_DeleteEmptyValues.
  static void AppendProperties(const XMPMeta& source, XMPMeta* dest, XMP_OptionBits options);
  // Copies the subtree (or, with an empty sourceRoot, the whole namespace)
  // replacing what dest has there; empty destNS/destRoot mean the source's.
  // A missing source subtree raises kXMPErr_BadXPath.
  static void DuplicateSubtree(const XMPMeta& source, XMPMeta* dest, const std::string& sourceNS,
                               const std::string& sourceRoot, const std::string& destNS = std::string(),
                               const std::string& destRoot = std::string(), XMP_OptionBits options = 0);
  // One property, a whole namespace (empty propName), or every external
  // property (both empty; kXMPUtil_DoAllProperties includes internal ones).
  static void RemoveProperties(XMPMeta* xmpObj, const std::string& schemaNS = std::string(),
                               const std::string& propName = std::string(), XMP_OptionBits options = 0);

  // ---- Several files as one ----
  // Adds source to the aggregate target, marking differing properties
  // multi-valued; counts collections in transient "MultiFileCount".
  static void MultiFileCollect(XMPMeta* target, const XMPMeta& source, XMP_OptionBits options = 0);
  // Writes the aggregate's single-valued properties into member, then
  // applies the aggregate's deletion records.
  static void MultiFileDistribute(const XMPMeta& aggregate, XMPMeta* member, XMP_OptionBits options = 0);

  // True for properties that applications own (history, ids, dates of the
  // metadata itself, technical image data, the transient namespace).
  static bool IsInternalProperty(const std::string& schemaNS, const std::string& propName);
};

}  // namespace ovraxmp
