// Not part of the interface: the formatter tables, the built-in photographic
// formatters and aggregators, and their registration at start-up.
#pragma once

#include <boost/function.hpp>

#include <ovrametadata/Format.h>

namespace ovrametadata {

using ValueFormatterFn = boost::function<UTF8String(XMPMetaRef, const Path&, const UTF8String&)>;
using ValueAggregatorFn =
    boost::function<bool(XMPMetaRef, const Path&, UTF8String&, GetValueResult*)>;

// Namespaces of the properties that have built-in formatters, fallbacks or
// aggregators.
inline constexpr char kNamespace_Exif[] = "http://ns.adobe.com/exif/1.0/";
inline constexpr char kNamespace_ExifEX[] = "http://cipa.jp/exif/1.0/";
inline constexpr char kNamespace_ExifAUX[] = "http://ns.adobe.com/exif/1.0/aux/";
inline constexpr char kNamespace_Tiff[] = "http://ns.adobe.com/tiff/1.0/";
// Home of the constructed properties (prefix "ovraAgg").
inline constexpr char kNamespace_OrlexAggregate[] = "http://ns.ovrametadata.org/xmp/aggregate/1.0/";

// ---------------------------------------------------------------------------
// Tables. Each registration replaces an earlier one for the same path. They
// are filled at start-up and only read afterwards; no lock.

void AddValueFormatter(const Path& path, const ValueFormatterFn& formatter);
void AddFallbackPath(const Path& path, Path fallback);
void AddValueAggregator(const Path& path, const ValueAggregatorFn& aggregator);

// Registers the built-in formatters, fallback paths and aggregators; called
// by Initialize once the definitions are loaded (paths are built from them,
// so a property whose schema is missing gets an empty path as key).
void RegisterBuiltInFormatters();
// Empties the formatter, fallback-path and aggregator tables (last Terminate).
// The application-wide formatter is the host's and is kept.
void ClearFormatterTables();

// ---------------------------------------------------------------------------
// Rational texts

// Splits "numerator/denominator"; false when either part is missing or empty.
bool CalculateFractionFromRational(const UTF8String& raw, double& numerator,
                                   double& denominator);
// The value of a rational text; 0 when it cannot be split, and a zero
// denominator counts as 1.
double GetFractionValue(const UTF8String& raw);

// ---------------------------------------------------------------------------
// Photographic figures

// An f-number as number text only (">1024" below 1, one decimal below 8,
// none from 8 on).
UTF8String FormatFNumber(double f);
// An exposure time in seconds, snapped to the nearest standard speed when
// close to one, as localised "<number> sec".
UTF8String FormatExposureTime(double seconds);

// Value formatters registered for EXIF paths.
UTF8String FormatExifExposureTime(XMPMetaRef xmp, const Path& path, const UTF8String& raw);
UTF8String FormatExifShutterSpeedValue(XMPMetaRef xmp, const Path& path, const UTF8String& raw);
UTF8String FormatExifFNumber(XMPMetaRef xmp, const Path& path, const UTF8String& raw);
UTF8String FormatExifApertureValue(XMPMetaRef xmp, const Path& path, const UTF8String& raw);
UTF8String FormatExifDistance(XMPMetaRef xmp, const Path& path, const UTF8String& raw);

// Value aggregators registered for the constructed properties.
bool FormatShutterSpeed(XMPMetaRef xmp, const Path& path, UTF8String& out,
                        GetValueResult* result);
bool FormatPhotographicSensitivity(XMPMetaRef xmp, const Path& path, UTF8String& out,
                                   GetValueResult* result);
bool FormatImageSize(XMPMetaRef xmp, const Path& path, UTF8String& out, GetValueResult* result);
bool FormatImageResolution(XMPMetaRef xmp, const Path& path, UTF8String& out,
                           GetValueResult* result);

}  // namespace ovrametadata
