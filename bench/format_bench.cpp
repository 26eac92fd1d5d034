// Display formatting: FormatValue through every built-in formatter, the
// type-driven formatters and the constructed camera properties.
// Target: FormatValue of an exposure time under 1 µs.
#include <string>

#include <benchmark/benchmark.h>

#include <ovrametadata/Format.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Values.h>
#include <ovraxmp/XMPMeta.h>

namespace {

using namespace ovrametadata;

constexpr char kExif[] = "http://ns.adobe.com/exif/1.0/";
constexpr char kExifAux[] = "http://ns.adobe.com/exif/1.0/aux/";
constexpr char kExifEX[] = "http://cipa.jp/exif/1.0/";
constexpr char kTiff[] = "http://ns.adobe.com/tiff/1.0/";
constexpr char kAggregate[] = "http://ns.ovrametadata.org/xmp/aggregate/1.0/";

struct Library {
  Library() { Initialize(); }
  ~Library() { Terminate(); }
};

void EnsureLibrary() { static Library library; }

Path P(const char* ns, const char* name) {
  return PathForSchemaNameAndPropertyName(UTF8String(ns), UTF8String(name));
}

void BM_FormatValue(benchmark::State& state, const char* ns, const char* name, const char* raw,
                    const char* expected) {
  EnsureLibrary();
  const Path path = P(ns, name);
  const UTF8String rawValue(raw);
  if (FormatValue(nullptr, path, rawValue) != expected) {
    state.SkipWithError("built-in formatter not registered");
    return;
  }
  for (auto _ : state) benchmark::DoNotOptimize(FormatValue(nullptr, path, rawValue));
}

BENCHMARK_CAPTURE(BM_FormatValue, ExposureTime, kExif, "ExposureTime", "1/250", "1/250 sec");
BENCHMARK_CAPTURE(BM_FormatValue, ExposureTimeSecondPass, kExif, "ExposureTime", "1/1024",
                  "1/1000 sec");
BENCHMARK_CAPTURE(BM_FormatValue, ExposureTimeRounded, kExif, "ExposureTime", "1/14060",
                  "1/14100 sec");
BENCHMARK_CAPTURE(BM_FormatValue, ShutterSpeedValue, kExif, "ShutterSpeedValue", "8/1",
                  "1/250 sec");
BENCHMARK_CAPTURE(BM_FormatValue, FNumber, kExif, "FNumber", "28/10", "2.8");
BENCHMARK_CAPTURE(BM_FormatValue, ApertureValue, kExif, "ApertureValue", "5/1", "5.7");
BENCHMARK_CAPTURE(BM_FormatValue, MaxApertureValue, kExif, "MaxApertureValue", "3/1", "2.8");
BENCHMARK_CAPTURE(BM_FormatValue, SubjectDistance, kExif, "SubjectDistance", "1234/1000", "1.23");
BENCHMARK_CAPTURE(BM_FormatValue, ApproximateFocusDistance, kExifAux, "ApproximateFocusDistance",
                  "4294967295/1", "\xE2\x88\x9E");

void BM_FormatRational(benchmark::State& state) {
  const UTF8String raw("1/3");
  for (auto _ : state) benchmark::DoNotOptimize(FormatRational(raw, 2));
}
BENCHMARK(BM_FormatRational);

void BM_FormatGPSCoordinate(benchmark::State& state) {
  const UTF8String raw("122,25,10W");
  for (auto _ : state) benchmark::DoNotOptimize(FormatGPSCoordinate(raw));
}
BENCHMARK(BM_FormatGPSCoordinate);

void BM_FormatDate(benchmark::State& state) {
  const UTF8String raw("2024-01-05T15:04:05-05:00");
  for (auto _ : state) benchmark::DoNotOptimize(FormatDate(raw));
}
BENCHMARK(BM_FormatDate);

void BM_GetConstructedValue(benchmark::State& state, const char* ns, const char* name) {
  EnsureLibrary();
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(std::string(R"(<rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">)") +
                       R"(<rdf:Description rdf:about="" xmlns:exif=")" + kExif +
                       R"(" xmlns:exifEX=")" + kExifEX + R"(" xmlns:aux=")" + kExifAux +
                       R"(" xmlns:tiff=")" + kTiff + R"(">)" +
                       "<exif:PixelXDimension>4000</exif:PixelXDimension>"
                       "<exif:PixelYDimension>3000</exif:PixelYDimension>"
                       "<tiff:Orientation>6</tiff:Orientation>"
                       "<tiff:XResolution>300/1</tiff:XResolution>"
                       "<tiff:YResolution>300/1</tiff:YResolution>"
                       "<exif:ExposureTime>1/250</exif:ExposureTime>"
                       "<exif:ISOSpeedRatings><rdf:Seq><rdf:li>400</rdf:li></rdf:Seq>"
                       "</exif:ISOSpeedRatings>"
                       "<aux:Lens>24-70mm</aux:Lens>"
                       "</rdf:Description></rdf:RDF>");
  const Path path = P(ns, name);
  UTF8String value;
  if (!GetConstructedValue(meta.GetInternalRef(), path, value, nullptr)) {
    state.SkipWithError("no constructed value");
    return;
  }
  for (auto _ : state) {
    GetConstructedValue(meta.GetInternalRef(), path, value, nullptr);
    benchmark::DoNotOptimize(value);
  }
}

BENCHMARK_CAPTURE(BM_GetConstructedValue, LensModelFallback, kExifEX, "LensModel");
BENCHMARK_CAPTURE(BM_GetConstructedValue, ImageSize, kAggregate, "ImageSize");
BENCHMARK_CAPTURE(BM_GetConstructedValue, ImageResolution, kAggregate, "ImageResolution");
BENCHMARK_CAPTURE(BM_GetConstructedValue, ShutterSpeed, kAggregate, "ShutterSpeed");
BENCHMARK_CAPTURE(BM_GetConstructedValue, PhotographicSensitivity, kAggregate,
                  "PhotographicSensitivity");

}  // namespace

BENCHMARK_MAIN();
