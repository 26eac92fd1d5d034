// Providers and the format cache.
// Targets: the aggregate rebuild grows linearly with the member count; an
// aggregate write-back to 100 files costs at most 1.5 times 100 single-file
// write-backs; a cached GetXMPFormat costs under 2 microseconds.
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <boost/make_shared.hpp>

#include <ovracore/Strings.h>
#include <ovraxmp/XMPFiles.h>
#include <ovraxmp/XMPMeta.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/MetadataUtils.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/Values.h>

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ProviderPtr = boost::shared_ptr<MetaDataProvider>;

constexpr char kXMPNS[] = "http://ns.adobe.com/xap/1.0/";

struct Library {
  Library() { Initialize(); }
  ~Library() { Terminate(); }
};
void EnsureLibrary() { static Library library; }

// A scratch folder removed at exit.
struct Scratch {
  Scratch() {
    std::string pattern = (fs::temp_directory_path() / "ovra-provbench-XXXXXX").string();
    if (::mkdtemp(pattern.data())) path = pattern;
  }
  ~Scratch() {
    std::error_code ec;
    fs::remove_all(path, ec);
  }
  fs::path path;
};
const fs::path& ScratchFolder() {
  static Scratch scratch;
  return scratch.path;
}

// A packet of a dozen properties; label, rating and one tag differ per index.
std::string PacketText(int index) {
  const std::string body =
      "<dc:subject><rdf:Bag><rdf:li>harbour</rdf:li><rdf:li>boats</rdf:li><rdf:li>tag" +
      std::to_string(index % 3) + "</rdf:li></rdf:Bag></dc:subject>";
  return "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF "
         "xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\"><rdf:Description rdf:about=\"\" "
         "xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
         "xmlns:photoshop=\"http://ns.adobe.com/photoshop/1.0/\" "
         "xmp:CreatorTool=\"Bench\" xmp:Label=\"label" +
         std::to_string(index % 7) + "\" xmp:Rating=\"" + std::to_string(index % 5) +
         "\" xmp:Nickname=\"shot\" photoshop:City=\"Lisbon\" photoshop:Country=\"Portugal\" "
         "photoshop:Headline=\"Harbour\" photoshop:Credit=\"Bench\" photoshop:Source=\"camera\">" +
         body +
         "<dc:title><rdf:Alt><rdf:li xml:lang=\"x-default\">Title</rdf:li></rdf:Alt></dc:title>"
         "<dc:creator><rdf:Seq><rdf:li>Someone</rdf:li><rdf:li>Else</rdf:li></rdf:Seq></dc:creator>"
         "</rdf:Description></rdf:RDF></x:xmpmeta>";
}

class NullBufferProvider : public BufferProviderImpl {
 public:
  explicit NullBufferProvider(const std::string& text)
      : BufferProviderImpl(reinterpret_cast<const unsigned char*>(text.data()), text.size()) {}
  void WriteBuffer(const std::vector<Path>&, const char*, std::size_t) override {}
};

std::string MinimalJPEG() {
  std::string out("\xFF\xD8\xFF\xE0\x00\x10JFIF\x00\x01\x01\x00\x00\x01\x00\x01\x00\x00", 20);
  out += std::string("\xFF\xDB\x00\x43\x00", 5) + std::string(64, '\x01');
  out += std::string("\xFF\xC0\x00\x0B\x08\x00\x01\x00\x01\x01\x01\x11\x00", 13);
  for (char tableClass : {'\x00', '\x10'}) {
    out += std::string("\xFF\xC4\x00\x14", 4);
    out += tableClass;
    out += '\x01';
    out += std::string(16, '\0');
  }
  out += std::string("\xFF\xDA\x00\x08\x01\x01\x00\x00\x3F\x00\x3F\xFF\xD9", 13);
  return out;
}

std::vector<fs::path> MakeFiles(const std::string& stem, int count) {
  std::vector<fs::path> files;
  for (int i = 0; i < count; ++i) {
    const fs::path file = ScratchFolder() / (stem + std::to_string(i) + ".jpg");
    std::ofstream(file, std::ios::binary) << MinimalJPEG();
    ovraxmp::XMPMeta packet;
    packet.ParseFromBuffer(PacketText(i));
    ovraxmp::XMPFiles handler(file.string(), ovraxmp::kXMP_UnknownFile, ovraxmp::kXMPFiles_OpenForUpdate);
    handler.PutXMP(packet);
    handler.CloseFile();
    files.push_back(file);
  }
  return files;
}

std::vector<ProviderPtr> OpenAll(const std::vector<fs::path>& files) {
  std::vector<ProviderPtr> providers;
  for (const fs::path& file : files) {
    providers.push_back(boost::make_shared<FileProvider>(ovracore::ToUTF16(file.string())));
  }
  return providers;
}

// ---------------------------------------------------------------------------

void BM_AggregateRebuild(benchmark::State& state) {
  EnsureLibrary();
  std::vector<ProviderPtr> providers;
  for (int i = 0; i < state.range(0); ++i) {
    providers.push_back(boost::make_shared<NullBufferProvider>(PacketText(i)));
  }
  AggregateProvider aggregate;
  for (auto _ : state) {
    aggregate.ResetProviders(Range<ProviderPtr>(providers));
    benchmark::DoNotOptimize(aggregate.MetaDataAccess());
  }
  state.SetComplexityN(state.range(0));
  state.counters["per_member_us"] = benchmark::Counter(
      static_cast<double>(state.range(0)), benchmark::Counter::kIsIterationInvariantRate |
                                                benchmark::Counter::kInvert);
}
BENCHMARK(BM_AggregateRebuild)->Arg(100)->Arg(300)->Arg(1000)->Unit(benchmark::kMillisecond)
    ->Complexity(benchmark::oN);

// One field edited in each of 100 files, each through its own guard.
void BM_WriteBack100SingleFiles(benchmark::State& state) {
  EnsureLibrary();
  const std::vector<ProviderPtr> providers = OpenAll(MakeFiles("single", 100));
  const Path label = PathForSchemaNameAndPropertyName(UTF8String(kXMPNS), "Label");
  int round = 0;
  for (auto _ : state) {
    const UTF8String value = "edit" + std::to_string(round++);
    for (const ProviderPtr& provider : providers) {
      MetaDataUpdateAccess access(provider);
      if (SetValue(*access, label, value)) access.AddChange(label);
    }
  }
  state.SetItemsProcessed(state.iterations() * 100);
}
BENCHMARK(BM_WriteBack100SingleFiles)->Unit(benchmark::kMillisecond);

// The same edit made once in an aggregate of the 100 files.
void BM_WriteBackAggregateOf100Files(benchmark::State& state) {
  EnsureLibrary();
  const std::vector<ProviderPtr> providers = OpenAll(MakeFiles("aggregate", 100));
  const auto aggregate = boost::make_shared<AggregateProvider>(Range<ProviderPtr>(providers));
  const Path label = PathForSchemaNameAndPropertyName(UTF8String(kXMPNS), "Label");
  int round = 0;
  for (auto _ : state) {
    const UTF8String value = "edit" + std::to_string(round++);
    MetaDataUpdateAccess access(aggregate);
    if (SetValue(*access, label, value)) access.AddChange(label);
  }
  state.SetItemsProcessed(state.iterations() * 100);
}
BENCHMARK(BM_WriteBackAggregateOf100Files)->Unit(benchmark::kMillisecond);

void BM_GetXMPFormatCached(benchmark::State& state) {
  EnsureLibrary();
  const std::u16string path = ovracore::ToUTF16(MakeFiles("cached", 1)[0].string());
  utility::GetXMPFormat(path);
  for (auto _ : state) benchmark::DoNotOptimize(utility::GetXMPFormat(path));
}
BENCHMARK(BM_GetXMPFormatCached);

void BM_GetXMPFormatUncached(benchmark::State& state) {
  EnsureLibrary();
  const std::u16string path = ovracore::ToUTF16(MakeFiles("uncached", 1)[0].string());
  for (auto _ : state) {
    utility::EraseCachedXMPFormat(path);
    benchmark::DoNotOptimize(utility::GetXMPFormat(path));
  }
}
BENCHMARK(BM_GetXMPFormatUncached)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
