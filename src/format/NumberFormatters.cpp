// Rational numbers and GPS coordinates as display text.
#include "format/FormatInternal.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <vector>

#include <ovracore/Strings.h>

namespace ovrametadata {

namespace {

// More decimals than a double carries only pad with zeros; a huge count from a
// caller must not turn into a huge allocation.
constexpr unsigned long kMaxDecimals = 20;

constexpr char kDegreeSign[] = "\xC2\xB0";  // U+00B0

// Degrees and minutes are 8-bit quantities: larger values stop at 255,
// negative or unreadable ones read as 0.
std::uint8_t CapToUInt8(double value) {
  if (!(value > 0.0)) return 0;
  if (value >= 255.0) return 255;
  return static_cast<std::uint8_t>(value);
}

std::uint8_t ReadUInt8Capped(const UTF8String& text) {
  return CapToUInt8(ovracore::CoerceToDouble(ovracore::TrimBlanks(text)));
}

}  // namespace

bool CalculateFractionFromRational(const UTF8String& raw, double& numerator,
                                   double& denominator) {
  const std::vector<UTF8String> tokens = ovracore::Tokenize(raw, "/");
  if (tokens.size() < 2 || tokens[0].empty() || tokens[1].empty()) return false;
  numerator = ovracore::CoerceToDouble(tokens[0]);
  denominator = ovracore::CoerceToDouble(tokens[1]);
  return true;
}

double GetFractionValue(const UTF8String& raw) {
  double numerator = 0.0;
  double denominator = 1.0;
  if (!CalculateFractionFromRational(raw, numerator, denominator)) return 0.0;
  if (denominator == 0.0) denominator = 1.0;
  return numerator / denominator;
}

UTF8String FormatRational(const UTF8String& value, unsigned long decimals) {
  double numerator = 0.0;
  double denominator = 0.0;
  if (!CalculateFractionFromRational(value, numerator, denominator) || denominator == 0.0)
    return UTF8String();
  return ovracore::NumberToString(numerator / denominator,
                                  static_cast<unsigned>(std::min(decimals, kMaxDecimals)));
}

UTF8String FormatGPSCoordinate(const UTF8String& value) {
  if (value.empty()) return UTF8String();
  // The direction letter is shown as given; it is not checked.
  const char direction = value.back();
  const std::vector<UTF8String> parts =
      ovracore::Tokenize(std::string_view(value).substr(0, value.size() - 1), ",");

  std::uint8_t degrees = 0;
  std::uint8_t minutes = 0;
  double seconds = 0.0;
  unsigned secondsDecimals = 0;
  switch (parts.size()) {
    case 1:
      degrees = ReadUInt8Capped(parts[0]);
      break;
    case 2: {
      // Degrees and decimal minutes.
      degrees = ReadUInt8Capped(parts[0]);
      const double decimalMinutes = ovracore::CoerceToDouble(parts[1]);
      double wholeMinutes = 0.0;
      seconds = std::modf(decimalMinutes, &wholeMinutes) * 60.0;
      minutes = CapToUInt8(wholeMinutes);
      secondsDecimals = 2;
      break;
    }
    case 3:
      degrees = ReadUInt8Capped(parts[0]);
      minutes = ReadUInt8Capped(parts[1]);
      seconds = ovracore::CoerceToDouble(parts[2]);
      break;
    default:
      break;
  }

  if (degrees == 0 && minutes == 0 && seconds == 0.0) return UTF8String("0") + kDegreeSign;

  UTF8String text = ovracore::NumberToString(degrees, 0);
  text += kDegreeSign;
  text += ' ';
  if (minutes != 0 || seconds != 0.0) {
    text += ovracore::NumberToString(minutes, 0);
    text += "' ";
  }
  if (seconds != 0.0) {
    text += ovracore::NumberToString(seconds, secondsDecimals);
    text += "\" ";
  }
  text += direction;
  return text;
}

}  // namespace ovrametadata
