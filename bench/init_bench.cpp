// Start-up and the definitions parser.
// Targets: Initialize + Terminate with the built-in resources and 20 custom
// definitions files of 50 properties each under 5 ms; the parser reads at
// least 20 MB/s of definitions XML; start-up with the built-in views loaded
// under 5 ms.
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include <benchmark/benchmark.h>
#include <boost/range/size.hpp>
#include <unistd.h>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Views.h>

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;

constexpr int kCustomFiles = 20;
constexpr int kPropertiesPerFile = 50;

std::string DefinitionsFile(int file, int properties) {
  std::string text =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
      "<xmp_definitions xmlns:ui=\"http://ns.ovrametadata.org/xmp/propsheet/ui/\">\n";
  const std::string id = std::to_string(file);
  text += "  <xmp_schema namespace=\"http://example.com/bench/" + id + "/\" prefix=\"bench" + id +
          "\" label=\"$$$/bench/schema" + id + "=Bench schema " + id +
          "\" description=\"Generated for the start-up benchmark\">\n";
  for (int p = 0; p < properties; ++p) {
    const std::string name = "property" + std::to_string(p);
    switch (p % 4) {
      case 0:
        text += "    <xmp_property name=\"" + name + "\" type=\"text\" label=\"$$$/bench/" + id +
                "/" + name + "=Property " + name + "\" description=\"A text property\"/>\n";
        break;
      case 1:
        text += "    <xmp_property name=\"" + name +
                "\" type=\"integer\" min=\"0\" max=\"100\" label=\"Number\"/>\n";
        break;
      case 2:
        text += "    <xmp_property name=\"" + name +
                "\" type=\"bag\" element_type=\"text\" ui:multiLine=\"true\"/>\n";
        break;
      default:
        text += "    <xmp_property name=\"" + name +
                "\" type=\"closedchoice\" element_type=\"integer\">\n"
                "      <xmp_choice raw_value=\"0\" label=\"Off\"/>\n"
                "      <xmp_choice raw_value=\"1\" label=\"On\"/>\n"
                "    </xmp_property>\n";
        break;
    }
  }
  text += "  </xmp_schema>\n</xmp_definitions>\n";
  return text;
}

// Private data roots holding the custom definitions files, removed at exit.
class CustomFolders {
 public:
  explicit CustomFolders(int files) {
    std::string pattern = (fs::temp_directory_path() / "ovrabench-XXXXXX").string();
    if (!mkdtemp(pattern.data())) std::abort();
    mRoot = pattern;
    fs::create_directories(mRoot / "user");
    fs::create_directories(mRoot / "local");
    const fs::path custom = mRoot / "user" / "Orlex/XMP/Custom Propsheet Panels/4.0/custom";
    fs::create_directories(custom);
    for (int file = 0; file < files; ++file) {
      std::ofstream out(custom / ("Bench" + std::to_string(file) + ".xml"), std::ios::binary);
      out << DefinitionsFile(file, kPropertiesPerFile);
    }
  }
  void Use() const {
    setenv("OVRAMETADATA_USER_ROOT", (mRoot / "user").c_str(), 1);
    setenv("OVRAMETADATA_LOCAL_ROOT", (mRoot / "local").c_str(), 1);
  }
  ~CustomFolders() {
    std::error_code ec;
    fs::remove_all(mRoot, ec);
  }

 private:
  fs::path mRoot;
};

void EnsureCustomFolders() {
  static const CustomFolders folders(kCustomFiles);
  folders.Use();
}
void EnsureEmptyFolders() {
  static const CustomFolders folders(0);
  folders.Use();
}

void BM_InitializeTerminate(benchmark::State& state) {
  EnsureCustomFolders();
  // Check once that the custom files really load.
  Initialize();
  const bool loaded = static_cast<bool>(NamespaceDefinition("http://example.com/bench/19/"));
  Terminate();
  if (!loaded) {
    state.SkipWithError("the custom definitions files were not loaded");
    return;
  }
  for (auto _ : state) {
    Initialize();
    Terminate();
  }
}
BENCHMARK(BM_InitializeTerminate)->Unit(benchmark::kMillisecond);

// What a panel host does before it shows its first panel: the built-in
// definitions and views, no custom files.
void BM_InitializeWithViews(benchmark::State& state) {
  EnsureEmptyFolders();
  std::size_t views = 0;
  for (auto _ : state) {
    Initialize();
    LoadAllViewDefinitions();
    state.PauseTiming();
    views = static_cast<std::size_t>(boost::size(CommonViewDefinitions()));
    Terminate();
    state.ResumeTiming();
  }
  if (views < 10) state.SkipWithError("the built-in views were not loaded");
}
BENCHMARK(BM_InitializeWithViews)->Unit(benchmark::kMillisecond);

void BM_ParseDefinitions(benchmark::State& state) {
  std::string buffer;
  for (int file = 0; buffer.size() < static_cast<std::size_t>(state.range(0)); ++file) {
    buffer += DefinitionsFile(file, kPropertiesPerFile);
  }
  // One document: drop the inner declarations and roots between files.
  std::string document =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
      "<xmp_definitions xmlns:ui=\"http://ns.ovrametadata.org/xmp/propsheet/ui/\">\n";
  for (std::size_t pos = 0;;) {
    const auto start = buffer.find("<xmp_schema", pos);
    if (start == std::string::npos) break;
    const auto end = buffer.find("</xmp_schema>", start) + 13;
    document.append(buffer, start, end - start);
    pos = end;
  }
  document += "\n</xmp_definitions>\n";
  std::size_t schemas = 0;
  for (auto _ : state) {
    const DefinitionsPair result = ParseBufferForDefinitions(document, u"bench");
    schemas = result.first.size();
    benchmark::DoNotOptimize(schemas);
  }
  if (schemas == 0 || HasErrors()) state.SkipWithError("the generated document did not parse");
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) *
                          static_cast<std::int64_t>(document.size()));
}
BENCHMARK(BM_ParseDefinitions)->Arg(64 << 10)->Arg(1 << 20)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
