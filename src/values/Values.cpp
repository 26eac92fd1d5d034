// Typed reading and writing of values at a Path: the storage forms, the
// generic read and write procedures and the text reader's validation.
#include <ovrametadata/Values.h>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdint>
#include <exception>
#include <utility>

#include <boost/optional.hpp>

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>
#include <ovraxmp/XMPToolkit.h>
#include <ovrametadata/Format.h>
#include <ovrametadata/Initialize.h>

#include "paths/PathsInternal.h"
#include "values/ValuesInternal.h"

namespace ovrametadata {

void ReportInvalidData(ErrorType type, const Path& path, const UTF16String& source) {
  SendError(type,
            ovracore::ZString("$$$/ovrametadata/ErrorInXMPData/InvalidData=invalid data in "
                              "#{quot}@0#{quot}.",
                              {path.namespaceURI + path.description}),
            source);
}

namespace {

using ovraxmp::XMPMeta;
using ovraxmp::XMPUtils;

const char kArraySeparator[] = "; ";
const char kArrayQuotes[] = "\"";
const char kDefaultLanguage[] = "x-default";
const char kDateTypeId[] = "date";

void SetResult(GetValueResult* result, GetValueResult value) {
  if (result) *result = value;
}

bool IsDateEntry(const EntryDefinition& entry) {
  return entry.type && *entry.type == kDateTypeId;
}

// ---- Storage forms ----
// Each has a reader (false when nothing could be read) and a writer; both
// throw the toolkit's error on failure. kReadsAbsentAsFalse tells whether
// the reader itself answers false for a missing property, which spares the
// generic procedure a separate existence test on the hot path.

// Copies a value that was read into out; false when there was none.
template <class T, class U>
bool Take(std::optional<U> read, T& out) {
  if (!read) return false;
  out = static_cast<T>(*read);
  return true;
}

bool Take(std::optional<ovraxmp::XMP_Node> read, UTF8String& out) {
  if (!read) return false;
  out = std::move(read->value);
  return true;
}

struct SimpleText {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, UTF8String& out) const {
    return Take(meta.GetProperty(path.namespaceURI, path.description), out);
  }
  void Write(XMPMeta& meta, const Path& path, const UTF8String& value) const {
    meta.SetProperty(path.namespaceURI, path.description, value);
  }
};

// Catenating an absent array gives an empty text, not a failure.
struct ArrayText {
  static constexpr bool kReadsAbsentAsFalse = false;
  bool ordered;
  ovraxmp::XMP_OptionBits Options() const {
    return ordered ? ovraxmp::kXMP_PropArrayIsOrdered : ovraxmp::kXMP_NoOptions;
  }
  bool Read(const XMPMeta& meta, const Path& path, UTF8String& out) const {
    out = XMPUtils::CatenateArrayItems(meta, path.namespaceURI, path.description, kArraySeparator,
                                 kArrayQuotes, Options());
    return true;
  }
  void Write(XMPMeta& meta, const Path& path, const UTF8String& value) const {
    XMPUtils::SeparateArrayItems(&meta, path.namespaceURI, path.description, Options(), value);
  }
};

struct AltText {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, UTF8String& out) const {
    auto chosen = meta.GetLocalizedText(path.namespaceURI, path.description, std::string(), kDefaultLanguage);
    if (!chosen) return false;
    out = std::move(chosen->value);
    return true;
  }
  void Write(XMPMeta& meta, const Path& path, const UTF8String& value) const {
    meta.SetLocalizedText(path.namespaceURI, path.description, std::string(), kDefaultLanguage,
                          value);
  }
};

// One language of an alternative, matched exactly: no fallback to another
// language, and writing it leaves every other item as it is.
struct LanguageText {
  static constexpr bool kReadsAbsentAsFalse = true;
  UTF8String language;

  // The 1-based index of the item, 0 when there is none.
  ovraxmp::XMP_Index Find(const XMPMeta& meta, const Path& path) const {
    if (!meta.DoesPropertyExist(path.namespaceURI, path.description)) return 0;
    const ovraxmp::XMP_Index count = meta.CountArrayItems(path.namespaceURI, path.description);
    for (ovraxmp::XMP_Index i = 1; i <= count; ++i) {
      const auto tag = meta.GetProperty(path.namespaceURI, ItemLanguagePath(path, i));
      if (tag && ovracore::EqualsIgnoreCaseASCII(tag->value, language)) {
        return i;
      }
    }
    return 0;
  }
  static std::string ItemLanguagePath(const Path& path, ovraxmp::XMP_Index index) {
    return path.description + "[" + std::to_string(index) + "]/?xml:lang";
  }
  bool Read(const XMPMeta& meta, const Path& path, UTF8String& out) const {
    const ovraxmp::XMP_Index index = Find(meta, path);
    return index > 0 && Take(meta.GetArrayItem(path.namespaceURI, path.description, index), out);
  }
  void Write(XMPMeta& meta, const Path& path, const UTF8String& value) const {
    const ovraxmp::XMP_Index index = Find(meta, path);
    if (index > 0) {
      meta.SetArrayItem(path.namespaceURI, path.description, index, value);
    } else if (!meta.DoesPropertyExist(path.namespaceURI, path.description) ||
               meta.CountArrayItems(path.namespaceURI, path.description) == 0) {
      // A new alternative gets its "x-default" item as well.
      meta.SetLocalizedText(path.namespaceURI, path.description, std::string(), language, value);
    } else {
      meta.AppendArrayItem(path.namespaceURI, path.description, kAltTextOptions, value);
      const auto count = meta.CountArrayItems(path.namespaceURI, path.description);
      meta.SetProperty(path.namespaceURI, ItemLanguagePath(path, count), language);
    }
  }
  static constexpr ovraxmp::XMP_OptionBits kAltTextOptions =
      ovraxmp::kXMP_PropValueIsArray | ovraxmp::kXMP_PropArrayIsOrdered |
      ovraxmp::kXMP_PropArrayIsAlternate | ovraxmp::kXMP_PropArrayIsAltText;
};

// "en", "de-CH", "x-default": subtags of one to eight letters or digits.
bool IsLanguageTag(const UTF8String& tag) {
  if (tag.empty() || !std::isalpha(static_cast<unsigned char>(tag.front()))) return false;
  std::size_t run = 0;
  for (const char c : tag) {
    if (c == '-') {
      if (run == 0) return false;
      run = 0;
    } else if (std::isalnum(static_cast<unsigned char>(c)) && ++run <= 8) {
      continue;
    } else {
      return false;
    }
  }
  return run > 0;
}

bool IsAltTextEntry(const Path& path) {
  const auto entry = PathEntryDefinition(path);
  const auto primitive = entry ? detail::PrimitiveTypeOfEntry(*entry) : boost::none;
  return primitive && *primitive == kPrimitiveType_alt;
}

// Read as text and normalised through the toolkit's date conversion.
struct DateText {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, UTF8String& out) const {
    const auto stored = meta.GetProperty(path.namespaceURI, path.description);
    if (!stored) return false;
    out = XMPUtils::ConvertFromDate(XMPUtils::ConvertToDate(stored->value));
    return true;
  }
  void Write(XMPMeta& meta, const Path& path, const UTF8String& value) const {
    meta.SetProperty_Date(path.namespaceURI, path.description, XMPUtils::ConvertToDate(value));
  }
};

struct BoolValue {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, bool& out) const {
    return Take(meta.GetProperty_Bool(path.namespaceURI, path.description), out);
  }
  void Write(XMPMeta& meta, const Path& path, bool value) const {
    meta.SetProperty_Bool(path.namespaceURI, path.description, value);
  }
};

struct IntValue {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, int& out) const {
    return Take(meta.GetProperty_Int(path.namespaceURI, path.description), out);
  }
  void Write(XMPMeta& meta, const Path& path, int value) const {
    meta.SetProperty_Int(path.namespaceURI, path.description, value);
  }
};

struct Int64Value {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, long long& out) const {
    return Take(meta.GetProperty_Int64(path.namespaceURI, path.description), out);
  }
  void Write(XMPMeta& meta, const Path& path, long long value) const {
    meta.SetProperty_Int64(path.namespaceURI, path.description, value);
  }
};

struct DoubleValue {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, double& out) const {
    return Take(meta.GetProperty_Float(path.namespaceURI, path.description), out);
  }
  void Write(XMPMeta& meta, const Path& path, double value) const {
    meta.SetProperty_Float(path.namespaceURI, path.description, value);
  }
};

struct DateValue {
  static constexpr bool kReadsAbsentAsFalse = true;
  bool Read(const XMPMeta& meta, const Path& path, Date& out) const {
    const auto stored = meta.GetProperty(path.namespaceURI, path.description);
    if (!stored) return false;
    const ovraxmp::XMP_DateTime dateTime = XMPUtils::ConvertToUTCTime(XMPUtils::ConvertToDate(stored->value));
    out.year = dateTime.year;
    out.month = dateTime.month;
    out.day = dateTime.day;
    out.hour = dateTime.hour;
    out.minute = dateTime.minute;
    out.second = dateTime.second;
    return true;
  }
};

// ---- The generic procedures ----

template <class T, class Storage>
bool ReadValue(XMPMetaRef xmp, const Path& path, T& out, GetValueResult* result,
               const Storage& storage) {
  SetResult(result, ValueAbsent);
  if (!xmp) return false;
  try {
    const XMPMeta meta(xmp);
    if (meta.IsMultiValued(path.namespaceURI, path.description)) {
      SetResult(result, ValueMixed);
      return false;
    }
    if (!Storage::kReadsAbsentAsFalse &&
        !meta.DoesPropertyExist(path.namespaceURI, path.description)) {
      return false;
    }
    T value{};
    if (!storage.Read(meta, path, value)) return false;
    out = std::move(value);
    SetResult(result, ValueFound);
    return true;
  } catch (...) {
    // Toolkit errors and anything else alike: the data cannot be read.
    ReportInvalidData(kErrorReadingXMP, path);
    SetResult(result, ValueError);
    return false;
  }
}

// Typed values differ unless both sides were read and are equal.
template <class T>
bool Differs(const boost::optional<T>& old, const T& value) {
  return !old || !(*old == value);
}

// An absent text only differs from a non-empty one, so clearing a missing
// property writes nothing.
bool Differs(const boost::optional<UTF8String>& old, const UTF8String& value) {
  return old ? *old != value : !value.empty();
}

template <class T>
bool SameAsWritten(const T& readBack, const T& written) {
  return readBack == written;
}

// The toolkit re-spaces array items; that is not a difference.
bool SameAsWritten(const UTF8String& readBack, const UTF8String& written) {
  auto withoutSpaces = [](UTF8String text) {
    text.erase(std::remove(text.begin(), text.end(), ' '), text.end());
    return text;
  };
  return withoutSpaces(readBack) == withoutSpaces(written);
}

template <class T, class Storage>
boost::optional<T> ReadCurrent(const XMPMeta& meta, const Path& path, const Storage& storage) {
  try {
    if (!Storage::kReadsAbsentAsFalse &&
        !meta.DoesPropertyExist(path.namespaceURI, path.description)) {
      return boost::none;
    }
    T value{};
    if (storage.Read(meta, path, value)) return value;
  } catch (const std::exception&) {
    // Unreadable old data is simply replaced.
  }
  return boost::none;
}

template <class T, class Storage>
bool WriteValue(XMPMetaRef xmp, const Path& path, const T& value, const Storage& storage) {
  if (!xmp) return false;
  bool written = false;
  try {
    XMPMeta meta(xmp);
    const boost::optional<T> old = ReadCurrent<T>(meta, path, storage);
    const bool multiValued = meta.IsMultiValued(path.namespaceURI, path.description);
    if (!multiValued && !Differs(old, value)) return false;

    storage.Write(meta, path, value);
    written = true;

    const boost::optional<T> readBack = ReadCurrent<T>(meta, path, storage);
    if (!readBack || !SameAsWritten(*readBack, value)) ReportInvalidData(kErrorWritingXMP, path);

    if (multiValued) meta.ClearMultiValueInfo(path.namespaceURI, path.description);
    return true;
  } catch (...) {
    ReportInvalidData(kErrorWritingXMP, path);
    return written;
  }
}

// ---- The text reader's validation ----

bool IsAmongChoices(const EntryDefinition& entry, const UTF8String& text) {
  auto choices = &entry.constraints.choices;
  // An entry of a named choice type may leave its values to the type.
  boost::shared_ptr<TypeDefinition> type;
  if (choices->empty() && entry.type) {
    type = TypeIdDefinition(*entry.type);
    if (type) choices = &type->constraints.choices;
  }
  if (std::any_of(choices->begin(), choices->end(), [&](const boost::shared_ptr<ChoiceDefinition>& choice) {
        return choice && choice->rawValue == text;
      })) {
    return true;
  }
  // Numbers are the same choice in any form: a rating written "5.0" is "5".
  const auto number = [](const UTF8String& t) -> boost::optional<double> {
    double value = 0;
    const auto [end, error] = std::from_chars(t.data(), t.data() + t.size(), value);
    if (t.empty() || error != std::errc() || end != t.data() + t.size()) return boost::none;
    return value;
  };
  const auto& element =
      entry.constraints.elementType || !type ? entry.constraints.elementType : type->constraints.elementType;
  const bool numeric = element && (*element == "real" || *element == "integer");
  const auto value = numeric ? number(text) : boost::none;
  return value && std::any_of(choices->begin(), choices->end(), [&](const boost::shared_ptr<ChoiceDefinition>& c) {
           return c && number(c->rawValue) == value;
         });
}

bool IsValidBooleanText(XMPMetaRef xmp, const Path& path, const UTF8String& text) {
  bool value = false;
  if (!ReadValue(xmp, path, value, nullptr, BoolValue())) return true;
  if (value) return text == "1" || ovracore::EqualsIgnoreCaseASCII(text, "True");
  return text == "0" || ovracore::EqualsIgnoreCaseASCII(text, "False");
}

bool IsValidIntegerText(XMPMetaRef xmp, const Path& path, const UTF8String& text) {
  long long value = 0;
  if (!ReadValue(xmp, path, value, nullptr, Int64Value())) return true;
  std::string canonical;
  canonical = XMPUtils::ConvertFromInt64(value);
  return canonical == text;
}

void ValidateText(XMPMetaRef xmp, const Path& path, const EntryDefinition& entry,
                  const boost::optional<PrimitiveType>& primitive, const UTF8String& text) {
  if (!primitive) return;
  bool valid = true;
  switch (*primitive) {
    case kPrimitiveType_closedchoice:
      valid = IsAmongChoices(entry, text);
      break;
    case kPrimitiveType_boolean:
      valid = IsValidBooleanText(xmp, path, text);
      break;
    case kPrimitiveType_integer:
      try {
        valid = IsValidIntegerText(xmp, path, text);
      } catch (const std::exception&) {
        valid = false;
      }
      break;
    default:
      break;
  }
  if (!valid) ReportInvalidData(kErrorReadingXMP, path);
}

bool ReadStoredText(XMPMetaRef xmp, const Path& path, const boost::optional<PrimitiveType>& primitive,
                    UTF8String& raw, GetValueResult* result) {
  switch (*primitive) {
    case kPrimitiveType_bag:
      return ReadValue(xmp, path, raw, result, ArrayText{false});
    case kPrimitiveType_seq:
      return ReadValue(xmp, path, raw, result, ArrayText{true});
    case kPrimitiveType_alt:
      return ReadValue(xmp, path, raw, result, AltText());
    default:
      return ReadValue(xmp, path, raw, result, SimpleText());
  }
}

}  // namespace

// ---------------------------------------------------------------------------
// Readers

bool GetValue(XMPMetaRef xmp, const Path& path, bool& value, GetValueResult* result) {
  return ReadValue(xmp, path, value, result, BoolValue());
}

bool GetValue(XMPMetaRef xmp, const Path& path, int& value, GetValueResult* result) {
  return ReadValue(xmp, path, value, result, IntValue());
}

bool GetValue(XMPMetaRef xmp, const Path& path, long long& value, GetValueResult* result) {
  return ReadValue(xmp, path, value, result, Int64Value());
}

bool GetValue(XMPMetaRef xmp, const Path& path, double& value, GetValueResult* result) {
  return ReadValue(xmp, path, value, result, DoubleValue());
}

bool GetValue(XMPMetaRef xmp, const Path& path, Date& value, GetValueResult* result) {
  SetResult(result, ValueAbsent);
  const auto entry = PathEntryDefinition(path);
  if (!entry) {
    SetResult(result, ValueError);
    return false;
  }
  if (!IsDateEntry(*entry)) return false;
  return ReadValue(xmp, path, value, result, DateValue());
}

bool GetValue(XMPMetaRef xmp, const Path& path, UTF8String& value, GetValueResult* result) {
  const auto entry = PathEntryDefinition(path);
  if (!entry) {
    SetResult(result, ValueError);
    return false;
  }
  const auto primitive = detail::PrimitiveTypeOfEntry(*entry);

  UTF8String raw;
  bool read = IsDateEntry(*entry) && ReadValue(xmp, path, raw, result, DateText());
  if (!read && primitive) read = ReadStoredText(xmp, path, primitive, raw, result);
  try {
    if (!read) {
      // Internal properties that are not stored may be constructed from others.
      if (path.internal) return GetConstructedValue(xmp, path, value, result);
      return false;
    }
    UTF8String text;
    if (path.internal && !IsAllMetadataForcedWritable()) text = FormatValue(xmp, path, raw);
    if (text.empty()) text = raw;
    if (!text.empty()) ValidateText(xmp, path, *entry, primitive, text);
    value = std::move(text);
    return true;
  } catch (...) {
    // A formatter or aggregator that fails (an empty registered function
    // throws) must not reach the caller.
    ReportInvalidData(kErrorReadingXMP, path);
    SetResult(result, ValueError);
    return false;
  }
}

bool GetRawStringValue(XMPMetaRef xmp, const Path& path, UTF8String& value,
                       GetValueResult* result) {
  return ReadValue(xmp, path, value, result, SimpleText());
}

// ---------------------------------------------------------------------------
// Writers

bool SetValue(XMPMetaRef xmp, const Path& path, bool value) {
  return WriteValue(xmp, path, value, BoolValue());
}

bool SetValue(XMPMetaRef xmp, const Path& path, int value) {
  return WriteValue(xmp, path, value, IntValue());
}

bool SetValue(XMPMetaRef xmp, const Path& path, long long value) {
  return WriteValue(xmp, path, value, Int64Value());
}

bool SetValue(XMPMetaRef xmp, const Path& path, double value) {
  return WriteValue(xmp, path, value, DoubleValue());
}

bool SetValue(XMPMetaRef xmp, const Path& path, const UTF8String& value) {
  const auto entry = PathEntryDefinition(path);
  if (!entry) return false;
  if (IsDateEntry(*entry)) {
    // Compared and verified in the toolkit's normal form, which is what is
    // stored ("2024-05-01T14:30:00" is kept as "2024-05-01T14:30").
    UTF8String normal;
    try {
      ovraxmp::XMP_DateTime dateTime;
      dateTime = XMPUtils::ConvertToDate(value);
      normal = XMPUtils::ConvertFromDate(dateTime);
    } catch (const std::exception&) {
      ReportInvalidData(kErrorWritingXMP, path);
      return false;
    }
    return WriteValue(xmp, path, normal, DateText());
  }
  const auto primitive = detail::PrimitiveTypeOfEntry(*entry);
  if (!xmp || !primitive) return false;
  switch (*primitive) {
    case kPrimitiveType_bag:
      return WriteValue(xmp, path, value, ArrayText{false});
    case kPrimitiveType_seq:
      return WriteValue(xmp, path, value, ArrayText{true});
    case kPrimitiveType_alt:
      return WriteValue(xmp, path, value, AltText());
    default:
      return WriteValue(xmp, path, value, SimpleText());
  }
}

// ---------------------------------------------------------------------------
// Language alternatives

std::vector<UTF8String> GetAltTextLanguages(XMPMetaRef xmp, const Path& path) {
  std::vector<UTF8String> languages;
  if (!xmp) return languages;
  try {
    const XMPMeta meta(xmp);
    if (!meta.DoesPropertyExist(path.namespaceURI, path.description)) return languages;
    const auto count = meta.CountArrayItems(path.namespaceURI, path.description);
    for (ovraxmp::XMP_Index i = 1; i <= count; ++i) {
      if (const auto tag = meta.GetProperty(path.namespaceURI, LanguageText::ItemLanguagePath(path, i)))
        languages.push_back(tag->value);
    }
  } catch (...) {
    ReportInvalidData(kErrorReadingXMP, path);
  }
  return languages;
}

bool GetAltTextValue(XMPMetaRef xmp, const Path& path, const UTF8String& language,
                     UTF8String& value, GetValueResult* result) {
  return ReadValue(xmp, path, value, result, LanguageText{language});
}

bool SetAltTextValue(XMPMetaRef xmp, const Path& path, const UTF8String& language,
                     const UTF8String& value) {
  if (!IsLanguageTag(language) || !IsAltTextEntry(path)) {
    ReportInvalidData(kErrorWritingXMP, path);
    return false;
  }
  return WriteValue(xmp, path, value, LanguageText{language});
}

}  // namespace ovrametadata
