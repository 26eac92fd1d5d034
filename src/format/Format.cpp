// The formatter, fallback-path and aggregator tables, and the dispatch that
// turns a raw value into display text.
#include "format/FormatInternal.h"

#include <cstddef>
#include <functional>
#include <map>
#include <string_view>
#include <unordered_set>
#include <utility>

#include <boost/shared_ptr.hpp>

#include <ovrametadata/Definitions.h>

namespace ovrametadata {

namespace {

ValueFormatterFn sCustomFormatterFn;
std::map<Path, ValueFormatterFn> sFormatterFnMap;
std::map<Path, Path> sFallbackPathMap;
std::map<Path, ValueAggregatorFn> sValueAggregatorFnMap;
// Hashes of the paths of both tables above. A reader of all values asks
// about every internal property of every file, and nearly none has an
// entry: one hash lookup answers most questions instead of two tree walks
// over long namespace URIs.
std::unordered_set<std::size_t> sConstructedPathHashes;

std::size_t PathHash(const Path& path) {
  const std::hash<std::string_view> hash;
  return hash(path.namespaceURI) * 31u + hash(path.description);
}

Path BuiltInPath(const char* namespaceURI, const char* propertyName) {
  return PathForSchemaNameAndPropertyName(UTF8String(namespaceURI), UTF8String(propertyName));
}

bool IsEmptyPath(const Path& path) {
  return path.namespaceURI.empty() && path.description.empty();
}

}  // namespace

void RegisterValueFormatter(const ValueFormatterFn& formatter) { sCustomFormatterFn = formatter; }

ValueFormatterFn RegisteredValueFormatter() { return sCustomFormatterFn; }

void AddValueFormatter(const Path& path, const ValueFormatterFn& formatter) {
  sFormatterFnMap[path] = formatter;
}

void AddFallbackPath(const Path& path, Path fallback) {
  sFallbackPathMap[path] = std::move(fallback);
  sConstructedPathHashes.insert(PathHash(path));
}

void AddValueAggregator(const Path& path, const ValueAggregatorFn& aggregator) {
  sValueAggregatorFnMap[path] = aggregator;
  sConstructedPathHashes.insert(PathHash(path));
}

UTF8String FormatValue(XMPMetaRef xmp, const Path& path, const UTF8String& rawValue) {
  if (sCustomFormatterFn) {
    UTF8String custom = sCustomFormatterFn(xmp, path, rawValue);
    if (!custom.empty()) return custom;
  }

  const auto formatter = sFormatterFnMap.find(path);
  if (formatter != sFormatterFnMap.end())
    return formatter->second ? formatter->second(xmp, path, rawValue) : UTF8String();

  const boost::shared_ptr<EntryDefinition> entry = PathEntryDefinition(path);
  if (!entry || !entry->type) return UTF8String();
  const UTF8String& type = *entry->type;
  if (type == "date") return FormatDate(rawValue);
  if (type == "rational") return FormatRational(rawValue, 2);
  if (type == "gpscoordinate") return FormatGPSCoordinate(rawValue);
  return UTF8String();
}

bool GetConstructedValue(XMPMetaRef xmp, const Path& path, UTF8String& outValue,
                         GetValueResult* outResult) {
  if (sConstructedPathHashes.count(PathHash(path)) == 0) return false;
  const auto fallback = sFallbackPathMap.find(path);
  if (fallback != sFallbackPathMap.end() && GetValue(xmp, fallback->second, outValue, outResult))
    return true;

  const auto aggregator = sValueAggregatorFnMap.find(path);
  if (aggregator != sValueAggregatorFnMap.end())
    return aggregator->second(xmp, path, outValue, outResult);
  return false;
}

void RegisterBuiltInFormatters() {
  // A property whose schema is not registered gets an empty path; entries
  // under that key would answer for every empty path, so they are left out.
  const auto formatter = [](const char* ns, const char* name, const ValueFormatterFn& fn) {
    const Path path = BuiltInPath(ns, name);
    if (!IsEmptyPath(path)) AddValueFormatter(path, fn);
  };
  const auto fallback = [](const char* ns, const char* name, const char* fallbackNS,
                           const char* fallbackName) {
    const Path path = BuiltInPath(ns, name);
    if (!IsEmptyPath(path)) AddFallbackPath(path, BuiltInPath(fallbackNS, fallbackName));
  };
  const auto aggregator = [](const char* name, const ValueAggregatorFn& fn) {
    const Path path = BuiltInPath(kNamespace_OrlexAggregate, name);
    if (!IsEmptyPath(path)) AddValueAggregator(path, fn);
  };

  formatter(kNamespace_Exif, "ExposureTime", FormatExifExposureTime);
  formatter(kNamespace_Exif, "ShutterSpeedValue", FormatExifShutterSpeedValue);
  formatter(kNamespace_Exif, "FNumber", FormatExifFNumber);
  formatter(kNamespace_Exif, "ApertureValue", FormatExifApertureValue);
  formatter(kNamespace_Exif, "MaxApertureValue", FormatExifApertureValue);
  formatter(kNamespace_Exif, "SubjectDistance", FormatExifDistance);
  formatter(kNamespace_ExifAUX, "ApproximateFocusDistance", FormatExifDistance);

  // The newer CIPA properties fall back to the older auxiliary ones; the GPS
  // error goes the other way, to its CIPA twin.
  fallback(kNamespace_ExifEX, "LensModel", kNamespace_ExifAUX, "Lens");
  fallback(kNamespace_ExifEX, "BodySerialNumber", kNamespace_ExifAUX, "SerialNumber");
  fallback(kNamespace_ExifEX, "LensSerialNumber", kNamespace_ExifAUX, "LensSerialNumber");
  fallback(kNamespace_ExifEX, "CameraOwnerName", kNamespace_ExifAUX, "OwnerName");
  fallback(kNamespace_Exif, "GPSHPositioningError", kNamespace_ExifEX, "GPSHPositioningError");

  aggregator("ImageSize", FormatImageSize);
  aggregator("ImageResolution", FormatImageResolution);
  aggregator("ShutterSpeed", FormatShutterSpeed);
  aggregator("PhotographicSensitivity", FormatPhotographicSensitivity);
}

void ClearFormatterTables() {
  sFormatterFnMap.clear();
  sFallbackPathMap.clear();
  sValueAggregatorFnMap.clear();
  sConstructedPathHashes.clear();
}

}  // namespace ovrametadata
