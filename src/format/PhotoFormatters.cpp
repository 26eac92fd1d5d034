// Exposure, aperture, distance and sensitivity figures as a photographer
// reads them, and the constructed camera properties.
#include "format/FormatInternal.h"

#include <cmath>
#include <cstdint>
#include <exception>
#include <iterator>
#include <utility>

#include <ovracore/Localizer.h>
#include <ovracore/Strings.h>

namespace ovrametadata {

namespace {

constexpr char kOverflowMarker[] = ">1024";

// A rational with a numerator that fills all 32 bits (read as -1) is the EXIF
// marker for "infinitely far".
constexpr std::int32_t kExifInfinity = -1;

// The orientations 5 to 8 turn the image by a quarter, so the stored width
// is the displayed height.
bool IsRotatedOrientation(int orientation) { return orientation >= 5 && orientation <= 8; }

// The numerator as the 32-bit integer EXIF stores, wrapping like an unsigned
// 32-bit field read as signed.
std::int32_t TruncateToInt32(double value) {
  if (!std::isfinite(value) || std::fabs(value) >= 9.0e18) return 1;  // neither marker
  const auto wide = static_cast<std::int64_t>(value);
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(static_cast<std::uint64_t>(wide)));
}

// The nominal shutter speed that a measured time stands for, or 0 when no
// standard speed is within 2 %.
double MatchStandardSpeed(double seconds) {
  static constexpr double kStandardSpeed[] = {
      30,         25,         20,          15,          13,         10,         8,
      6,          5,          4,           3.2,         3,          2.5,        2,
      1.6,        1.5,        1.3,         1,           0.8,        0.7,        0.6,
      0.5,        0.4,        0.3,         1.0 / 4,     1.0 / 5,    1.0 / 6,    1.0 / 8,
      1.0 / 10,   1.0 / 13,   1.0 / 15,    1.0 / 20,    1.0 / 25,   1.0 / 30,   1.0 / 40,
      1.0 / 45,   1.0 / 50,   1.0 / 60,    1.0 / 80,    1.0 / 90,   1.0 / 100,  1.0 / 125,
      1.0 / 160,  1.0 / 180,  1.0 / 200,   1.0 / 250,   1.0 / 320,  1.0 / 350,  1.0 / 400,
      1.0 / 500,  1.0 / 640,  1.0 / 750,   1.0 / 800,   1.0 / 1000, 1.0 / 1250, 1.0 / 1500,
      1.0 / 1600, 1.0 / 2000, 1.0 / 2500,  1.0 / 3000,  1.0 / 3200, 1.0 / 4000, 1.0 / 5000,
      1.0 / 6000, 1.0 / 6400, 1.0 / 8000,  1.0 / 10000, 1.0 / 12000, 1.0 / 12800,
      1.0 / 16000};
  static_assert(std::size(kStandardSpeed) == 70, "one entry per standard speed");
  for (const double speed : kStandardSpeed) {
    if (0.98 * speed <= seconds && seconds <= 1.02 * speed) return speed;
  }
  return 0.0;
}

// The displayable speed for a time that matches no standard speed: whole
// seconds from 10 s, tenths from 0.5 s, below that the reciprocal rounded to
// a step that suits the range.
double RoundExposureTime(double t) {
  if (t >= 10.0) return std::floor(t + 0.5);
  if (t >= 0.5) return std::floor(10.0 * t + 0.5) / 10.0;
  double step = 0.001;
  if (t >= 0.05)
    step = 1.0;
  else if (t >= 1.0 / 130)
    step = 0.2;
  else if (t >= 1.0 / 750)
    step = 0.1;
  else if (t >= 1.0 / 1300)
    step = 0.02;
  else if (t >= 1.0 / 15000)
    step = 0.01;
  return step / std::floor(step / t + 0.5);
}

double SnapExposureTime(double t) {
  double speed = MatchStandardSpeed(t);
  // Many cameras store the power of two behind a nominal speed (1/256 for
  // 1/250, 1/64 for 1/60).
  if (speed == 0.0 && t < 0.1) speed = MatchStandardSpeed(t < 0.01 ? t * 1.024 : t * 16.0 / 15.0);
  if (speed == 0.0) speed = RoundExposureTime(t);
  return speed;
}

bool ReadText(XMPMetaRef xmp, const char* schema, const char* property, UTF8String& out,
              GetValueResult* result) {
  return GetValue(xmp, PathForSchemaNameAndPropertyName(UTF8String(schema), UTF8String(property)),
                  out, result);
}

bool ReadInt(XMPMetaRef xmp, const char* schema, const char* property, int& out,
             GetValueResult* result) {
  return GetValue(xmp, PathForSchemaNameAndPropertyName(UTF8String(schema), UTF8String(property)),
                  out, result);
}

bool IsMixedOrError(GetValueResult result) {
  return result == ValueMixed || result == ValueError;
}

}  // namespace

UTF8String FormatFNumber(double f) {
  // Below f/1 the figure is meaningless; the exposure-time overflow marker is
  // reused on purpose.
  if (f < 1.0) return kOverflowMarker;
  return ovracore::NumberToString(f, f < 8.0 ? 1 : 0);
}

UTF8String FormatExposureTime(double t) {
  UTF8String number;
  if (t > 1024.0) {
    number = kOverflowMarker;
  } else {
    // A non-positive time is not special-cased: it shows as "1/" and the
    // reciprocal of 0.
    const double speed = t > 0.0 ? SnapExposureTime(t) : 0.0;
    if (speed > 0.25)
      number = ovracore::NumberToString(speed, 1);
    else
      number = "1/" + ovracore::NumberToString(1.0 / speed, 0);
  }
  return ovracore::ZStringUTF8("$$$/ovrametadata/format/unit/second=@0 sec", {number});
}

UTF8String FormatExifExposureTime(XMPMetaRef, const Path&, const UTF8String& raw) {
  return FormatExposureTime(GetFractionValue(raw));
}

UTF8String FormatExifShutterSpeedValue(XMPMetaRef, const Path&, const UTF8String& raw) {
  // APEX time value to seconds.
  return FormatExposureTime(std::pow(2.0, -GetFractionValue(raw)));
}

UTF8String FormatExifFNumber(XMPMetaRef, const Path&, const UTF8String& raw) {
  return FormatFNumber(GetFractionValue(raw));
}

UTF8String FormatExifApertureValue(XMPMetaRef, const Path&, const UTF8String& raw) {
  // APEX aperture value to f-number.
  return FormatFNumber(std::pow(2.0, GetFractionValue(raw) * 0.5));
}

UTF8String FormatExifDistance(XMPMetaRef, const Path&, const UTF8String& raw) {
  double numerator = 0.0;
  double denominator = 0.0;
  if (!CalculateFractionFromRational(raw, numerator, denominator)) return UTF8String();
  const std::int32_t marker = TruncateToInt32(numerator);
  if (marker == 0) return ovracore::ZStringUTF8("$$$/ovrametadata/format/value/unknown=Unknown");
  if (marker == kExifInfinity)
    return ovracore::ZStringUTF8("$$$/ovrametadata/format/value/infinity=#{U+221E}");
  if (denominator == 0.0) return UTF8String();
  return ovracore::NumberToString(numerator / denominator, 2);
}

bool FormatShutterSpeed(XMPMetaRef xmp, const Path&, UTF8String& out, GetValueResult* result) {
  if (ReadText(xmp, kNamespace_Exif, "ShutterSpeedValue", out, result)) return true;
  return ReadText(xmp, kNamespace_Exif, "ExposureTime", out, result);
}

bool FormatPhotographicSensitivity(XMPMetaRef xmp, const Path&, UTF8String& out,
                                   GetValueResult* result) {
  GetValueResult localResult = ValueAbsent;
  GetValueResult* sensitivityResult = result ? result : &localResult;
  int sensitivity = 0;
  ReadInt(xmp, kNamespace_ExifEX, "PhotographicSensitivity", sensitivity, sensitivityResult);
  if (*sensitivityResult == ValueMixed) return false;

  Path firstRating;
  try {
    firstRating = CreatePathFromArrayItem(
        PathForSchemaNameAndPropertyName(UTF8String(kNamespace_Exif), UTF8String("ISOSpeedRatings")),
        1);
  } catch (const std::exception&) {
    // The item composition lets toolkit errors through; a constructed value
    // must not throw into the text read.
    if (result) *result = ValueError;
    return false;
  }
  UTF8String rating;
  if (!GetValue(xmp, firstRating, rating, result)) return false;

  // 65535 means "too high for the 16-bit field": the kind of sensitivity
  // then says which figure the rating is.
  const char* prefix = "ISO ";
  if (sensitivity == 65535) {
    int sensitivityType = 0;
    ReadInt(xmp, kNamespace_ExifEX, "SensitivityType", sensitivityType, nullptr);
    if (sensitivityType == 1 || sensitivityType == 4)
      prefix = "SOS ";
    else if (sensitivityType == 2)
      prefix = "REI ";
  }
  out = prefix + rating;
  return true;
}

bool FormatImageSize(XMPMetaRef xmp, const Path&, UTF8String& out, GetValueResult* result) {
  UTF8String width;
  UTF8String height;
  if (!ReadText(xmp, kNamespace_Exif, "PixelXDimension", width, result) ||
      !ReadText(xmp, kNamespace_Exif, "PixelYDimension", height, result)) {
    if (!ReadText(xmp, kNamespace_Tiff, "ImageWidth", width, result) ||
        !ReadText(xmp, kNamespace_Tiff, "ImageLength", height, result))
      return false;
  }

  int orientation = 0;
  GetValueResult orientationResult = ValueAbsent;
  ReadInt(xmp, kNamespace_Tiff, "Orientation", orientation, &orientationResult);
  if (IsMixedOrError(orientationResult)) {
    if (result) *result = orientationResult;
    return false;
  }
  if (IsRotatedOrientation(orientation)) std::swap(width, height);
  out = width + " x " + height;
  return true;
}

bool FormatImageResolution(XMPMetaRef xmp, const Path&, UTF8String& out,
                           GetValueResult* result) {
  UTF8String x;
  if (!ReadText(xmp, kNamespace_Tiff, "XResolution", x, result)) return false;

  UTF8String y;
  GetValueResult yResult = ValueAbsent;
  ReadText(xmp, kNamespace_Tiff, "YResolution", y, &yResult);
  int orientation = 0;
  GetValueResult orientationResult = ValueAbsent;
  ReadInt(xmp, kNamespace_Tiff, "Orientation", orientation, &orientationResult);
  for (const GetValueResult partial : {yResult, orientationResult}) {
    if (IsMixedOrError(partial)) {
      if (result) *result = partial;
      return false;
    }
  }

  if (IsRotatedOrientation(orientation)) std::swap(x, y);
  out = x == y ? x : x + " x " + y;
  return true;
}

}  // namespace ovrametadata
