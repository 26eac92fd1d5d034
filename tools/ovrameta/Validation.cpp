#include "Validation.h"

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <regex>
#include <vector>

#include "Names.h"
#include "TextUtil.h"

namespace ovrameta {

using namespace ovrametadata;

namespace {

std::string Quoted(const std::string& text) { return "\"" + text + "\""; }

std::string Trimmed(const std::string& text) {
  const auto first = text.find_first_not_of(" \t");
  if (first == std::string::npos) return std::string();
  const auto last = text.find_last_not_of(" \t");
  return text.substr(first, last - first + 1);
}

bool ParseInteger(const std::string& text, long long& number) {
  static const std::regex kInteger("[+-]?[0-9]+");
  if (!std::regex_match(text, kInteger)) return false;
  errno = 0;
  number = std::strtoll(text.c_str(), nullptr, 10);
  return errno != ERANGE;
}

bool ParseReal(const std::string& text, double& number) {
  static const std::regex kReal("[+-]?([0-9]+\\.?[0-9]*|\\.[0-9]+)([eE][+-]?[0-9]+)?");
  if (!std::regex_match(text, kReal)) return false;
  number = std::strtod(text.c_str(), nullptr);
  return std::isfinite(number);
}

bool IsDate(const std::string& text) {
  // The XMP date forms: a year, a month, a day, a time to the minute,
  // second or fraction, with an optional zone.
  static const std::regex kDate(
      "[0-9]{4}(-[0-9]{2}(-[0-9]{2}(T[0-9]{2}:[0-9]{2}(:[0-9]{2}(\\.[0-9]+)?)?"
      "(Z|[+-][0-9]{2}:[0-9]{2})?)?)?)?");
  return std::regex_match(text, kDate);
}

std::string ChoiceList(const EntryDefinition& entry) {
  std::string list;
  int shown = 0;
  const auto& choices = ChoicesOf(entry);
  for (const auto& choice : choices) {
    if (!choice) continue;
    if (shown == 12) {
      list += ", ...";
      break;
    }
    if (shown++ > 0) list += ", ";
    list += choice->rawValue;
    const std::string label = ToUTF8(choice->label);
    if (!label.empty() && label != choice->rawValue) list += " (" + label + ")";
  }
  return list;
}

std::string CheckBounds(const EntryDefinition& entry, double number, const std::string& text) {
  const auto& limits = entry.constraints;
  if ((limits.min && number < *limits.min) || (limits.max && number > *limits.max)) {
    std::string range;
    if (limits.min) range += "at least " + std::to_string(*limits.min);
    if (limits.min && limits.max) range += " and ";
    if (limits.max) range += "at most " + std::to_string(*limits.max);
    return Quoted(text) + " is out of range (" + range + ")";
  }
  return std::string();
}

// Checks one scalar of the given primitive kind; entry supplies choices and
// bounds.
std::string CheckScalar(PrimitiveType kind, const EntryDefinition& entry, std::string& value) {
  switch (kind) {
    case kPrimitiveType_integer: {
      long long number = 0;
      if (!ParseInteger(value, number)) return Quoted(value) + " is not an integer";
      value = std::to_string(number);
      return CheckBounds(entry, static_cast<double>(number), value);
    }
    case kPrimitiveType_real: {
      double number = 0;
      if (!ParseReal(value, number)) return Quoted(value) + " is not a number";
      return CheckBounds(entry, number, value);
    }
    case kPrimitiveType_boolean: {
      std::string lower;
      for (char c : value) lower += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
      if (lower == "true") {
        value = "True";
      } else if (lower == "false") {
        value = "False";
      } else {
        return Quoted(value) + " is not a boolean (True or False)";
      }
      return std::string();
    }
    case kPrimitiveType_closedchoice: {
      const auto& choices = ChoicesOf(entry);
      for (const auto& choice : choices) {
        if (choice && choice->rawValue == value) return std::string();
      }
      return Quoted(value) + " is not one of the allowed values: " + ChoiceList(entry);
    }
    default:
      return std::string();
  }
}

}  // namespace

std::string CheckValue(const Path& path, const EntryDefinition& entry, std::string& value) {
  if (entry.type && *entry.type == "date") {
    if (!IsDate(value)) {
      return Quoted(value) + " is not a date (YYYY-MM-DD, optionally with a time: "
                             "YYYY-MM-DDThh:mm:ss and a zone)";
    }
    return std::string();
  }
  const auto primitive = PrimitiveTypeOfPath(path);
  if (!primitive) return "it is a structure: set its fields (prefix:Struct/prefix:Field)";
  if (*primitive == kPrimitiveType_bag || *primitive == kPrimitiveType_seq) {
    const auto elementId = ElementTypeIdOf(entry);
    if (!elementId) return std::string();
    if (const auto elementType = TypeIdDefinition(*elementId)) {
      if (!elementType->fields.empty()) {
        return "its items are structures: set their fields (prefix:Array[1]/prefix:Field)";
      }
    }
    const auto elementKind = PrimitiveTypeOf(*elementId);
    if (!elementKind || *elementKind == kPrimitiveType_text) return std::string();
    // Items are written separated by ";"; each one must fit the element type.
    const auto elementEntry = TypeIdDefinition(*elementId);
    std::vector<std::string> items;
    std::string::size_type start = 0;
    while (true) {
      const auto end = value.find(';', start);
      items.push_back(Trimmed(value.substr(start, end - start)));
      if (end == std::string::npos) break;
      start = end + 1;
    }
    std::string joined;
    for (auto& item : items) {
      if (item.empty()) continue;
      const std::string reason =
          CheckScalar(*elementKind, elementEntry ? *elementEntry : entry, item);
      if (!reason.empty()) return "item " + reason;
      if (!joined.empty()) joined += "; ";
      joined += item;
    }
    value = joined;
    return std::string();
  }
  if (value.empty() && *primitive != kPrimitiveType_text && *primitive != kPrimitiveType_alt &&
      *primitive != kPrimitiveType_openchoice) {
    return "an empty value is not a " + PrimitiveTypeAsPrimitiveTypeId(*primitive) +
           " (use --delete to remove the value)";
  }
  if (*primitive == kPrimitiveType_closedchoice) {
    if (ChoicesOf(entry).empty()) {
      // A choice without a list of its own: its element type decides.
      const auto elementId = ElementTypeIdOf(entry);
      const auto elementKind = elementId ? PrimitiveTypeOf(*elementId) : boost::none;
      return elementKind ? CheckScalar(*elementKind, entry, value) : std::string();
    }
    return CheckScalar(kPrimitiveType_closedchoice, entry, value);
  }
  if (*primitive == kPrimitiveType_openchoice) {
    const auto elementId = ElementTypeIdOf(entry);
    const auto elementKind = elementId ? PrimitiveTypeOf(*elementId) : boost::none;
    if (elementKind && *elementKind != kPrimitiveType_text && !value.empty()) {
      return CheckScalar(*elementKind, entry, value);
    }
    return std::string();
  }
  return CheckScalar(*primitive, entry, value);
}

}  // namespace ovrameta
