// The XMP toolkit layer beside the raw exempi calls it wraps: single reads
// (targets: at most 25% over the raw call), array text, multi-file
// collection and distribution (targets: linear in the number of packets),
// parse and serialise of small and large packets, and the checks that run
// before the toolkit parses.
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <exempi/xmp.h>

#include <ovraxmp/XMPToolkit.h>

#include "../tests/xmp/HostileInputs.h"
#include "../tests/xmp/XMPMediaFiles.h"

namespace {

using namespace ovraxmp;

const char kNS[] = "http://ovra.bench/ns/";

struct Toolkit {
  Toolkit() {
    XMPMeta::Initialize();
    XMPMeta::RegisterNamespace(kNS, "ovb", nullptr);
  }
  ~Toolkit() { XMPMeta::Terminate(); }
};
const Toolkit& Start() {
  static Toolkit toolkit;
  return toolkit;
}

// About 40 properties: simple values, bags, structures and alt-text.
XMPMeta TypicalPacket(int variant) {
  Start();
  XMPMeta meta;
  for (int i = 0; i < 30; ++i)
    meta.SetProperty(kNS, "Simple" + std::to_string(i), i % 7 == 0 ? "v" + std::to_string(variant) : "same");
  for (int i = 0; i < 4; ++i) {
    const std::string name = "Bag" + std::to_string(i);
    meta.AppendArrayItem(kNS, name, kXMP_PropValueIsArray, "a");
    meta.AppendArrayItem(kNS, name, 0, i == 0 ? "b" + std::to_string(variant) : "b");
  }
  for (int i = 0; i < 3; ++i) {
    const std::string name = "Struct" + std::to_string(i);
    meta.SetStructField(kNS, name, kNS, "Field", "f");
    meta.SetStructField(kNS, name, kNS, "Other", variant % 2 ? "x" : "y");
  }
  meta.SetLocalizedText(kXMP_NS_DC, "title", "", "x-default", "Title");
  meta.SetLocalizedText(kXMP_NS_DC, "description", "", "x-default", "Description");
  meta.SetProperty_Int(kNS, "Number", 1234);
  return meta;
}

// A packet whose serialised form has about the given size.
std::string PacketText(std::size_t bytes) {
  Start();
  XMPMeta meta;
  std::string text;
  for (int i = 0;; ++i) {
    meta.SetProperty(kNS, "P" + std::to_string(i), std::string(60, 'a' + i % 26));
    if (i % 50 == 0) {
      text = meta.SerializeToBuffer(kXMP_OmitPacketWrapper);
      if (text.size() >= bytes) return text;
    }
  }
}

// The same packet for the layer and the raw calls: parsed from one text.
XMPMeta ParsedTypicalPacket() {
  std::string text;
  text = TypicalPacket(0).SerializeToBuffer();
  XMPMeta meta;
  meta.ParseFromBuffer(text);
  return meta;
}

void BM_GetProperty_Layer(benchmark::State& state) {
  XMPMeta meta = ParsedTypicalPacket();
  // Callers hold their names as strings already.
  const std::string ns = kNS, name = "Simple5";
  for (auto _ : state) {
    auto value = meta.GetProperty(ns, name);
    benchmark::DoNotOptimize(value);
  }
}
BENCHMARK(BM_GetProperty_Layer);

void BM_GetProperty_Raw(benchmark::State& state) {
  XMPMeta meta = TypicalPacket(0);
  std::string text;
  text = meta.SerializeToBuffer();
  XmpPtr xmp = xmp_new(text.data(), text.size());
  std::string value;
  for (auto _ : state) {
    XmpStringPtr s = xmp_string_new();
    uint32_t options = 0;
    xmp_get_property(xmp, kNS, "Simple5", s, &options);
    value.assign(xmp_string_cstr(s), xmp_string_len(s));
    xmp_string_free(s);
    benchmark::DoNotOptimize(value);
  }
  xmp_free(xmp);
}
BENCHMARK(BM_GetProperty_Raw);

void BM_GetPropertyInt_Layer(benchmark::State& state) {
  XMPMeta meta = ParsedTypicalPacket();
  const std::string ns = kNS, name = "Number";
  for (auto _ : state) {
    auto value = meta.GetProperty_Int(ns, name);
    benchmark::DoNotOptimize(value);
  }
}
BENCHMARK(BM_GetPropertyInt_Layer);

void BM_GetPropertyInt_Raw(benchmark::State& state) {
  XMPMeta meta = TypicalPacket(0);
  std::string text;
  text = meta.SerializeToBuffer();
  XmpPtr xmp = xmp_new(text.data(), text.size());
  int32_t value = 0;
  for (auto _ : state) {
    xmp_get_property_int32(xmp, kNS, "Number", &value, nullptr);
    benchmark::DoNotOptimize(value);
  }
  xmp_free(xmp);
}
BENCHMARK(BM_GetPropertyInt_Raw);

void BM_CatenateArrayItems(benchmark::State& state) {
  XMPMeta meta = TypicalPacket(0);
  for (int i = 0; i < 20; ++i) meta.AppendArrayItem(kNS, "Keywords", kXMP_PropValueIsArray, "keyword " + std::to_string(i));
  std::string text;
  for (auto _ : state) {
    text = XMPUtils::CatenateArrayItems(meta, kNS, "Keywords", "; ", "\"", 0);
    benchmark::DoNotOptimize(text);
  }
}
BENCHMARK(BM_CatenateArrayItems);

void BM_SeparateArrayItems(benchmark::State& state) {
  XMPMeta meta = TypicalPacket(0);
  std::string text;
  for (int i = 0; i < 20; ++i) text += "keyword " + std::to_string(i) + "; ";
  for (auto _ : state) XMPUtils::SeparateArrayItems(&meta, kNS, "Keywords", 0, text);
}
BENCHMARK(BM_SeparateArrayItems);

void BM_MultiFileCollect(benchmark::State& state) {
  std::vector<XMPMeta> packets;
  for (int i = 0; i < state.range(0); ++i) packets.push_back(TypicalPacket(i));
  for (auto _ : state) {
    XMPMeta target;
    for (const XMPMeta& packet : packets) XMPUtils::MultiFileCollect(&target, packet);
    benchmark::DoNotOptimize(target.GetInternalRef());
  }
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_MultiFileCollect)->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->Complexity(benchmark::oN)->Unit(benchmark::kMillisecond);

void BM_MultiFileDistribute(benchmark::State& state) {
  std::vector<XMPMeta> packets;
  for (int i = 0; i < state.range(0); ++i) packets.push_back(TypicalPacket(i));
  XMPMeta aggregate;
  for (const XMPMeta& packet : packets) XMPUtils::MultiFileCollect(&aggregate, packet);
  aggregate.SetProperty(kNS, "Simple1", "edited");
  for (auto _ : state) {
    for (XMPMeta& packet : packets) XMPUtils::MultiFileDistribute(aggregate, &packet);
  }
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_MultiFileDistribute)->Arg(1)->Arg(10)->Arg(100)->Arg(1000)->Complexity(benchmark::oN)->Unit(benchmark::kMillisecond);

void BM_Parse_Layer(benchmark::State& state) {
  const std::string text = PacketText(static_cast<std::size_t>(state.range(0)));
  XMPMeta meta;
  for (auto _ : state) meta.ParseFromBuffer(text);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * text.size()));
}
BENCHMARK(BM_Parse_Layer)->Arg(5 * 1024)->Arg(500 * 1024);

void BM_Parse_Raw(benchmark::State& state) {
  const std::string text = PacketText(static_cast<std::size_t>(state.range(0)));
  for (auto _ : state) {
    XmpPtr xmp = xmp_new_empty();
    xmp_parse(xmp, text.data(), text.size());
    xmp_free(xmp);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * text.size()));
}
BENCHMARK(BM_Parse_Raw)->Arg(5 * 1024)->Arg(500 * 1024);

void BM_Serialize_Layer(benchmark::State& state) {
  XMPMeta meta;
  meta.ParseFromBuffer(PacketText(static_cast<std::size_t>(state.range(0))));
  std::string out;
  for (auto _ : state) {
    out = meta.SerializeToBuffer();
    benchmark::DoNotOptimize(out);
  }
}
BENCHMARK(BM_Serialize_Layer)->Arg(5 * 1024)->Arg(500 * 1024);

void BM_Serialize_Raw(benchmark::State& state) {
  const std::string text = PacketText(static_cast<std::size_t>(state.range(0)));
  XmpPtr xmp = xmp_new(text.data(), text.size());
  std::string out;
  for (auto _ : state) {
    XmpStringPtr s = xmp_string_new();
    xmp_serialize(xmp, s, 0, 0);
    out.assign(xmp_string_cstr(s), xmp_string_len(s));
    xmp_string_free(s);
    benchmark::DoNotOptimize(out);
  }
  xmp_free(xmp);
}
BENCHMARK(BM_Serialize_Raw)->Arg(5 * 1024)->Arg(500 * 1024);

// ---- The checks before the toolkit parses (target: a real 500 KB packet,
// with a 2,400-item bag and 1,000 history events, parses at most 10% slower
// through the layer than through the raw call) ----

std::string RealPacket() {
  std::string keywords, history;
  for (int i = 0; i < 2400; ++i) keywords += "<rdf:li>keyword number " + std::to_string(i) + "</rdf:li>";
  for (int i = 0; i < 1000; ++i)
    history += "<rdf:li rdf:parseType=\"Resource\"><stEvt:action>saved</stEvt:action>"
               "<stEvt:instanceID>xmp.iid:5f1c2a4e-7b3d-4c8e-9a61-" + std::to_string(100000000000 + i) +
               "</stEvt:instanceID><stEvt:when>2024-03-01T10:15:30+01:00</stEvt:when>"
               "<stEvt:softwareAgent>Editor 12.1 (Macintosh)</stEvt:softwareAgent>"
               "<stEvt:changed>/metadata</stEvt:changed></rdf:li>";
  return "<?xpacket begin=\"\xEF\xBB\xBF\" id=\"W5M0MpCehiHzreSzNTczkc9d\"?><x:xmpmeta xmlns:x=\"adobe:ns:meta/\">"
         "<rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\"><rdf:Description rdf:about=\"\" "
         "xmlns:dc=\"http://purl.org/dc/elements/1.1/\" xmlns:xmpMM=\"http://ns.adobe.com/xap/1.0/mm/\" "
         "xmlns:stEvt=\"http://ns.adobe.com/xap/1.0/sType/ResourceEvent#\"><dc:subject><rdf:Bag>" +
         keywords + "</rdf:Bag></dc:subject><xmpMM:History><rdf:Seq>" + history +
         "</rdf:Seq></xmpMM:History></rdf:Description></rdf:RDF></x:xmpmeta><?xpacket end=\"w\"?>";
}

void BM_ParseRealPacket_Layer(benchmark::State& state) {
  Start();
  const std::string text = RealPacket();
  XMPMeta meta;
  for (auto _ : state) meta.ParseFromBuffer(text);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * text.size()));
}
BENCHMARK(BM_ParseRealPacket_Layer)->Unit(benchmark::kMillisecond);

void BM_ParseRealPacket_Raw(benchmark::State& state) {
  Start();
  const std::string text = RealPacket();
  for (auto _ : state) {
    XmpPtr xmp = xmp_new_empty();
    xmp_parse(xmp, text.data(), text.size());
    xmp_free(xmp);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * text.size()));
}
BENCHMARK(BM_ParseRealPacket_Raw)->Unit(benchmark::kMillisecond);

// A refusal must stay cheap: the deepest and the widest packets of the
// hostile inputs (target: well under a second each).
void BM_RefuseHostilePacket(benchmark::State& state) {
  Start();
  std::string text = "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
                     "<rdf:Description rdf:about=\"\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\">";
  const int count = 200000;
  for (int i = 0; i < count; ++i)
    text += state.range(0) ? "<xmp:a rdf:parseType=\"Resource\">" : "<xmp:p" + std::to_string(i) + ">v</xmp:p" + std::to_string(i) + ">";
  if (state.range(0))
    for (int i = 0; i < count; ++i) text += "</xmp:a>";
  text += "</rdf:Description></rdf:RDF></x:xmpmeta>";
  XMPMeta meta;
  for (auto _ : state) {
    try {
      meta.ParseFromBuffer(text);
    } catch (const XMP_Error&) {
    }
  }
  state.SetLabel(state.range(0) ? "200,000 levels" : "200,000 properties");
}
BENCHMARK(BM_RefuseHostilePacket)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

// Opening a hostile media file that must be refused (target: under a
// second each): 4 MB of Extended XMP nested 100,000 levels in a JPEG, and
// 20,000 nested udta boxes in an MP4.
void BM_RefuseHostileFile(benchmark::State& state) {
  Start();
  const std::string path = std::string(std::getenv("TMPDIR") ? std::getenv("TMPDIR") : "/tmp") +
                           "/ovra-bench-hostile" + (state.range(0) ? ".mp4" : ".jpg");
  {
    std::ofstream out(path, std::ios::binary);
    out << (state.range(0) ? hostile::Mp4WithNestedUdta(xmptest::media::Mp4(), 20000)
                           : hostile::JpegWithExtendedXMP(xmptest::media::Jpeg(), hostile::DeepResources(100000)));
  }
  for (auto _ : state) {
    XMPFiles file(path, kXMP_UnknownFile, kXMPFiles_OpenForRead | kXMPFiles_OpenAllowBackgroundFileOpen);
    XMPMeta meta;
    if (file.GetXMP(&meta)) state.SkipWithError("the hostile file was read");
  }
  std::remove(path.c_str());
  state.SetLabel(state.range(0) ? "MP4, 20,000 nested udta" : "JPEG, 4 MB Extended XMP");
}
BENCHMARK(BM_RefuseHostileFile)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
