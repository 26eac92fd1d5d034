// Typed value access and path walks, beside the toolkit layer's own
// get-property. Target: the text read of a simple property costs at most
// twice the plain get-property (definition lookup and multi-value test
// included).
#include <string>

#include <benchmark/benchmark.h>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Values.h>
#include <ovraxmp/XMPMeta.h>
#include <ovraxmp/XMPUtils.h>

namespace {

using namespace ovrametadata;

constexpr char kDC[] = "http://purl.org/dc/elements/1.1/";
constexpr char kXMP[] = "http://ns.adobe.com/xap/1.0/";
constexpr char kIptcCore[] = "http://iptc.org/std/Iptc4xmpCore/1.0/xmlns/";
constexpr char kTiff[] = "http://ns.adobe.com/tiff/1.0/";

constexpr char kPacket[] = R"(<x:xmpmeta xmlns:x="adobe:ns:meta/">
 <rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">
  <rdf:Description rdf:about=""
     xmlns:dc="http://purl.org/dc/elements/1.1/"
     xmlns:xmp="http://ns.adobe.com/xap/1.0/"
     xmlns:tiff="http://ns.adobe.com/tiff/1.0/"
     xmlns:Iptc4xmpCore="http://iptc.org/std/Iptc4xmpCore/1.0/xmlns/"
     xmp:Label="Harbour" xmp:CreatorTool="Bench Tool 1.0" xmp:Rating="4"
     xmp:CreateDate="2024-03-05T10:20:30+02:00" tiff:ImageWidth="6000">
   <dc:subject><rdf:Bag><rdf:li>harbour</rdf:li><rdf:li>boats</rdf:li><rdf:li>evening</rdf:li></rdf:Bag></dc:subject>
   <dc:title><rdf:Alt><rdf:li xml:lang="x-default">Harbour at dusk</rdf:li></rdf:Alt></dc:title>
   <Iptc4xmpCore:CreatorContactInfo rdf:parseType="Resource">
    <Iptc4xmpCore:CiAdrCity>Lisbon</Iptc4xmpCore:CiAdrCity>
   </Iptc4xmpCore:CreatorContactInfo>
  </rdf:Description>
 </rdf:RDF>
</x:xmpmeta>)";

struct Library {
  Library() { Initialize(); }
  ~Library() { Terminate(); }
};

void EnsureLibrary() { static Library library; }

ovraxmp::XMPMeta MakePacket() {
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(kPacket);
  return meta;
}

Path P(const char* ns, const char* name) {
  return PathForSchemaNameAndPropertyName(UTF8String(ns), UTF8String(name));
}

Path ContactCity() {
  const Path contact = P(kIptcCore, "CreatorContactInfo");
  return CreatePathFromStructureField(
      contact, FieldNameDefinition(TypeEntryDefinition(contact), "CiAdrCity"));
}

// The reference: the toolkit layer's own read of a simple property.
void BM_ToolkitGetProperty(benchmark::State& state) {
  EnsureLibrary();
  const ovraxmp::XMPMeta meta = MakePacket();
  const std::string ns(kXMP), name("Label");
  for (auto _ : state) benchmark::DoNotOptimize(meta.GetProperty(ns, name));
}
BENCHMARK(BM_ToolkitGetProperty);

void BM_GetValueText(benchmark::State& state, const Path& path) {
  EnsureLibrary();
  const ovraxmp::XMPMeta meta = MakePacket();
  UTF8String value;
  if (!GetValue(meta.GetInternalRef(), path, value)) {
    state.SkipWithError("property not readable: definitions missing?");
    return;
  }
  for (auto _ : state) {
    benchmark::DoNotOptimize(GetValue(meta.GetInternalRef(), path, value));
  }
}

void BM_GetValueSimple(benchmark::State& state) { BM_GetValueText(state, P(kXMP, "Label")); }
// Internal properties are formatted for display on top of the read.
void BM_GetValueSimpleInternal(benchmark::State& state) {
  BM_GetValueText(state, P(kXMP, "CreatorTool"));
}
void BM_GetValueBag(benchmark::State& state) { BM_GetValueText(state, P(kDC, "subject")); }
void BM_GetValueAlt(benchmark::State& state) { BM_GetValueText(state, P(kDC, "title")); }
void BM_GetValueStructField(benchmark::State& state) { BM_GetValueText(state, ContactCity()); }
void BM_GetValueDateText(benchmark::State& state) { BM_GetValueText(state, P(kXMP, "CreateDate")); }
BENCHMARK(BM_GetValueSimple);
BENCHMARK(BM_GetValueSimpleInternal);
BENCHMARK(BM_GetValueBag);
BENCHMARK(BM_GetValueAlt);
BENCHMARK(BM_GetValueStructField);
BENCHMARK(BM_GetValueDateText);

void BM_GetRawStringValue(benchmark::State& state) {
  EnsureLibrary();
  const ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kXMP, "Label");
  UTF8String value;
  for (auto _ : state) {
    benchmark::DoNotOptimize(GetRawStringValue(meta.GetInternalRef(), path, value));
  }
}
BENCHMARK(BM_GetRawStringValue);

void BM_GetValueInt(benchmark::State& state) {
  EnsureLibrary();
  const ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kXMP, "Rating");
  int value = 0;
  for (auto _ : state) benchmark::DoNotOptimize(GetValue(meta.GetInternalRef(), path, value));
}
BENCHMARK(BM_GetValueInt);

void BM_GetValueInt64(benchmark::State& state) {
  EnsureLibrary();
  const ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kTiff, "ImageWidth");
  long long value = 0;
  for (auto _ : state) benchmark::DoNotOptimize(GetValue(meta.GetInternalRef(), path, value));
}
BENCHMARK(BM_GetValueInt64);

void BM_GetValueDate(benchmark::State& state) {
  EnsureLibrary();
  const ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kXMP, "CreateDate");
  Date value;
  if (!GetValue(meta.GetInternalRef(), path, value)) {
    state.SkipWithError("xmp:CreateDate is not a date property");
    return;
  }
  for (auto _ : state) benchmark::DoNotOptimize(GetValue(meta.GetInternalRef(), path, value));
}
BENCHMARK(BM_GetValueDate);

// The same text again: read, compare, no write.
void BM_SetValueUnchanged(benchmark::State& state) {
  EnsureLibrary();
  ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kXMP, "Label");
  const UTF8String same("Harbour");
  for (auto _ : state) benchmark::DoNotOptimize(SetValue(meta.GetInternalRef(), path, same));
}
BENCHMARK(BM_SetValueUnchanged);

// Alternating texts: read, compare, write, read back.
void BM_SetValueChanged(benchmark::State& state) {
  EnsureLibrary();
  ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kXMP, "Label");
  const UTF8String texts[] = {"Harbour", "Harbour at night"};
  unsigned i = 0;
  for (auto _ : state) benchmark::DoNotOptimize(SetValue(meta.GetInternalRef(), path, texts[++i & 1]));
}
BENCHMARK(BM_SetValueChanged);

void BM_SetValueBagChanged(benchmark::State& state) {
  EnsureLibrary();
  ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kDC, "subject");
  const UTF8String texts[] = {"harbour; boats", "harbour; boats; evening"};
  unsigned i = 0;
  for (auto _ : state) benchmark::DoNotOptimize(SetValue(meta.GetInternalRef(), path, texts[++i & 1]));
}
BENCHMARK(BM_SetValueBagChanged);

void BM_SetValueIntChanged(benchmark::State& state) {
  EnsureLibrary();
  ovraxmp::XMPMeta meta = MakePacket();
  const Path path = P(kXMP, "Rating");
  int i = 0;
  for (auto _ : state) benchmark::DoNotOptimize(SetValue(meta.GetInternalRef(), path, ++i & 3));
}
BENCHMARK(BM_SetValueIntChanged);

void BM_DescendantLeafPathsAllSchemas(benchmark::State& state) {
  EnsureLibrary();
  std::size_t leaves = 0;
  for (auto _ : state) {
    leaves = 0;
    for (const auto& schema : CommonSchemaDefinitions()) {
      for (const Path& path : DescendantLeafPaths(schema)) {
        benchmark::DoNotOptimize(path.description.data());
        ++leaves;
      }
    }
  }
  state.counters["leaves"] = static_cast<double>(leaves);
}
BENCHMARK(BM_DescendantLeafPathsAllSchemas)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
