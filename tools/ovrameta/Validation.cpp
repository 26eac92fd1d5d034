#include "Validation.h"

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdio>
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

// A date in XMP form. The XMP forms (a year, a month, a day, a time to the
// minute, second or fraction, an optional zone) are kept; the EXIF form
// "2024:05:01 14:30:00" and a blank instead of "T" are converted.
bool ToXMPDate(std::string& text) {
  static const std::regex kDate(
      "([0-9]{4})(?:([-:])([0-9]{2})(?:\\2([0-9]{2})(?:[T ]([0-9]{2}:[0-9]{2}(?::[0-9]{2}(?:\\.[0-9]+)?)?)"
      "(Z|[+-][0-9]{2}:[0-9]{2})?)?)?)?");
  std::smatch m;
  if (!std::regex_match(text, m, kDate)) return false;
  std::string date = m[1];
  if (m[3].matched) date += "-" + m[3].str();
  if (m[4].matched) date += "-" + m[4].str();
  if (m[5].matched) date += "T" + m[5].str() + m[6].str();
  text = date;
  return true;
}

// A rational in XMP form: "1/250" as it is, a decimal number as a fraction
// ("2.8" becomes "28/10").
bool ToXMPRational(std::string& text) {
  static const std::regex kFraction("[+-]?[0-9]+/[0-9]+");
  static const std::regex kDecimal("([+-]?)([0-9]+)(?:\\.([0-9]{1,9}))?");
  std::smatch m;
  if (std::regex_match(text, kFraction)) return text.substr(text.find('/') + 1).find_first_not_of('0') != std::string::npos;
  if (!std::regex_match(text, m, kDecimal)) return false;
  const std::string fraction = m[3];
  std::string numerator = m[2].str() + fraction;
  numerator.erase(0, std::min(numerator.find_first_not_of('0'), numerator.size() - 1));
  text = m[1].str() + numerator + "/1" + std::string(fraction.size(), '0');
  return true;
}

// A GPS coordinate in XMP form ("48,51.5034N"), from decimal degrees
// ("48.8584", "-33.8568"), degrees, minutes and seconds ("48 51 30.2 N",
// 48° 51' 30.20" N) or the XMP forms.
bool ToXMPCoordinate(std::string& text, bool latitude) {
  static const std::regex kDecimal("([+-]?)([0-9]+(?:\\.[0-9]+)?)");
  static const std::regex kParts(
      "([0-9]+(?:\\.[0-9]+)?)(?:\\s*[°,]\\s*|\\s+)([0-9]+(?:\\.[0-9]+)?)?(?:\\s*['′,]\\s*|\\s+)?"
      "([0-9]+(?:\\.[0-9]+)?)?(?:\\s*(?:\"|″|'')\\s*|\\s*)([NSEWnsew])");
  std::smatch m;
  double degrees = 0;
  char hemisphere = 0;
  if (std::regex_match(text, m, kDecimal)) {
    degrees = std::strtod(m[2].str().c_str(), nullptr);
    hemisphere = latitude ? (m[1] == "-" ? 'S' : 'N') : (m[1] == "-" ? 'W' : 'E');
  } else if (std::regex_match(text, m, kParts)) {
    degrees = std::strtod(m[1].str().c_str(), nullptr);
    if (m[2].matched) degrees += std::strtod(m[2].str().c_str(), nullptr) / 60.0;
    if (m[3].matched) degrees += std::strtod(m[3].str().c_str(), nullptr) / 3600.0;
    hemisphere = static_cast<char>(std::toupper(static_cast<unsigned char>(m[4].str()[0])));
    if ((hemisphere == 'N' || hemisphere == 'S') != latitude) return false;
  } else {
    return false;
  }
  if (degrees > (latitude ? 90.0 : 180.0)) return false;
  const int whole = static_cast<int>(degrees);
  char buffer[48];
  std::snprintf(buffer, sizeof buffer, "%d,%.6f%c", whole, (degrees - whole) * 60.0, hemisphere);
  std::string minutes = buffer;
  // Trailing zeros of the minutes say nothing.
  const std::size_t dot = minutes.find('.');
  std::size_t last = minutes.size() - 2;
  while (last > dot && minutes[last] == '0') --last;
  if (last == dot) --last;
  text = minutes.substr(0, last + 1) + hemisphere;
  return true;
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
  const std::string type = entry.type ? *entry.type : std::string();
  if (type == "date" && !ToXMPDate(value)) {
    return Quoted(value) + " is not a date (2024-05-01, 2024-05-01T14:30:00, 2024:05:01 14:30:00; "
                           "a zone such as +02:00 or Z may follow the time)";
  }
  if (type == "rational" && !ToXMPRational(value)) {
    return Quoted(value) + " is not a rational number (a fraction such as 1/250 or a decimal such as 2.8)";
  }
  if (type == "gpscoordinate") {
    const bool latitude = entry.name.find("Latitude") != std::string::npos;
    if (!ToXMPCoordinate(value, latitude)) {
      return Quoted(value) + " is not a " + (latitude ? "latitude" : "longitude") +
             " (decimal degrees such as " + (latitude ? "48.8584 or -33.8568" : "2.2945 or -70.67") +
             ", degrees, minutes and seconds such as " + (latitude ? "48 51 30.2 N" : "2 17 40.2 E") +
             ", or the XMP form " + (latitude ? "48,51.504N" : "2,17.67E") + ")";
    }
  }
  if (type == "date" || type == "rational" || type == "gpscoordinate") return std::string();
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
