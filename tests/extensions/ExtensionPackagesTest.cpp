// Extension packages: which of two packages of one name is kept, what each
// broken package reports, and what a registered package brings in.
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>

#include <boost/range/algorithm/find_if.hpp>

#include <ovracore/Localizer.h>
#include <ovrametadata/Extensions.h>
#include <ovrametadata/Views.h>

#include "MetadataTestSupport.h"
#include "TestSupport.h"
#include "extensions/ExtensionsInternal.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;
using ovratest::U16;
using ovratest::U8;

namespace {

namespace fs = std::filesystem;

const char* const kManifestParsing = "Error parsing manifest file: ";
const char* const kRegistration = "Error registering extension package: ";

std::string Manifest(const std::string& name, const std::string& version, const std::string& prefix = "") {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n"
         "<extension xmlns=\"http://ns.ovrametadata.org/metadata/extension/1.0/\" name=\"" +
         name + "\" version=\"" + version + "\"" + (prefix.empty() ? "" : " locFilePrefix=\"" + prefix + "\"") +
         " />\n";
}

// A package folder with a manifest and a view file of one empty view.
fs::path MakePackage(const fs::path& root, const std::string& folder, const std::string& manifest) {
  const fs::path package = root / folder;
  fs::create_directories(package / "view");
  ovratest::WriteFile(package / "manifest.xml", manifest);
  ovratest::WriteFile(package / "view" / "v.xml",
                      "<views xmlns=\"http://ns.ovrametadata.org/metadata/ui/1.0/\"><view name=\"" + folder +
                          "\"/></views>");
  return package;
}

std::string Path(const fs::path& path) { return fs::absolute(path).lexically_normal().string(); }

class ExtensionPackages : public ::testing::Test {
 protected:
  void SetUp() override { ClearExtensionPackages(); }
  void TearDown() override { ClearExtensionPackages(); }
  std::vector<std::string> Registered() const {
    std::vector<std::string> out;
    for (const ExtensionPackage& p : RegisteredExtensionPackages())
      out.push_back(U8(p.name) + " " + std::to_string(p.version).substr(0, 3) + " " + fs::path(U8(p.path)).filename().string());
    return out;
  }
  ovratest::TempDir dir;
};

TEST_F(ExtensionPackages, TheHigherVersionStaysWhereverItIsFoundAndEqualVersionsKeepTheFirst) {
  struct Case {
    const char* what;
    std::string firstVersion, secondVersion;
    std::vector<std::string> kept;
    std::string message;     // after the headline
    const char* reportedOn;  // the folder the message names
  };
  const std::string different =
      "extension package with name \"Pkg\" already exists. Package with lower version number ";
  const std::vector<Case> cases = {
      {"newer second", "1.0", "1.5", {"Other 2.0 b", "Pkg 1.5 c"}, different + "\"1\" will be ignored.", "a"},
      {"newer first", "1.5", "1.0", {"Pkg 1.5 a", "Other 2.0 b"}, different + "\"1\" will be ignored.", "c"},
      {"equal", "2", "2.0", {"Pkg 2.0 a", "Other 2.0 b"}, "extension package with name \"Pkg\" already exists.", "a"},
      {"unreadable version", "draft", "0.5", {"Other 2.0 b", "Pkg 0.5 c"}, different + "\"0\" will be ignored.", "a"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    ClearExtensionPackages();
    ovratest::TempDir root;
    MakePackage(root.path(), "a", Manifest("Pkg", c.firstVersion));
    MakePackage(root.path(), "b", Manifest("Other", "2"));
    MakePackage(root.path(), "c", Manifest("Pkg", c.secondVersion));
    ErrorsSince since;
    RegisterExtensionPackages(U16(root.path().string()));
    EXPECT_EQ(Registered(), c.kept);
    const ErrorType type = kExtensionPackageRegistrationError;
    since.Expect(type, U16(Path(root / c.reportedOn)), {kRegistration + c.message});
  }
}

TEST_F(ExtensionPackages, EveryBrokenPackageIsReportedAndTheScanGoesOn) {
  const fs::path root = dir.path();
  fs::create_directories(root / "1-empty");
  ovratest::WriteFile(root / "2-a-file", "not a package");
  MakePackage(root, "3-not-xml", "name=Broken");
  MakePackage(root, "4-good", Manifest("Good", "1"));
  fs::create_directories(root / ".hidden");
  fs::create_directories(root / "5-no-manifest-but-views" / "view");

  ErrorsSince since;
  RegisterExtensionPackages(U16(root.string()));
  RegisterExtensionPackages(U16((root / "missing").string()));
  EXPECT_EQ(Registered(), std::vector<std::string>{"Good 1.0 4-good"});
  const std::string missing = std::string(kManifestParsing) + "manifest file is missing from extension package.";
  EXPECT_EQ(since.Texts(), (std::vector<std::string>{missing, missing, kManifestParsing + std::string("invalid XML."),
                                                     missing}));
  const auto infos = since.New();
  ASSERT_EQ(infos.size(), 4u);
  EXPECT_EQ(U8(infos[0].source), Path(root / "1-empty" / "manifest.xml"));
  EXPECT_EQ(U8(infos[1].source), Path(root / "2-a-file" / "manifest.xml"));
  EXPECT_EQ(U8(infos[2].source), Path(root / "3-not-xml" / "manifest.xml"));
  for (const auto& info : infos) EXPECT_EQ(info.type, kExtensionManifestParsingError);
}

TEST_F(ExtensionPackages, ARegisteredPackageBringsItsDictionarySchemasAndViews) {
  const fs::path user = ovratest::TestRoot() / "user";
  const fs::path packages = user / "Orlex/XMP/Metadata Extensions";
  EXPECT_EQ(U8(CustomExtensionsUserDirectory()), Path(packages));
  EXPECT_EQ(U8(CustomExtensionsGlobalDirectory()), Path(ovratest::TestRoot() / "local/Orlex/XMP/Metadata Extensions"));

  const fs::path full = MakePackage(packages, "Full", Manifest("Full", "1", "full"));
  fs::create_directories(full / "schema");
  fs::create_directories(full / "loc");
  ovratest::WriteFile(full / "schema" / "full.xml", R"(<xmp_definitions>
    <xmp_schema namespace="http://example.com/full/" prefix="full" label="$$$/full/schema=Full">
      <xmp_property name="Shelf" type="text" label="$$$/full/Shelf=Shelf"/>
    </xmp_schema></xmp_definitions>)");
  // Exactly ".xml": this one is not part of the package.
  ovratest::WriteFile(full / "schema" / "ignored.XML", "<not xml");
  ovratest::WriteFile(full / "view" / "v.xml", R"(<views xmlns="http://ns.ovrametadata.org/metadata/ui/1.0/"
      xmlns:full="http://example.com/full/"><view name="FullView"><property name="full:Shelf"/></view></views>)");
  ovratest::WriteFile(full / "loc" / "full_en_US.dict", "$$$/full/Shelf=Regal\n");
  // Its prefix names a dictionary, but there is no loc folder; still loaded.
  const fs::path noLoc = MakePackage(packages, "NoLoc", Manifest("NoLoc", "1", "noloc"));
  fs::create_directories(packages / "TextOnly" / "schema");
  ovratest::WriteFile(packages / "TextOnly" / "manifest.xml", Manifest("TextOnly", "1"));
  ovratest::WriteFile(packages / "TextOnly" / "schema" / "readme.txt", "nothing");

  ErrorsSince since;
  {
    ovratest::LibraryScope library;
    LoadAllViewDefinitions();
    EXPECT_EQ(Registered(), (std::vector<std::string>{"Full 1.0 Full", "NoLoc 1.0 NoLoc", "TextOnly 1.0 TextOnly"}));
    const ViewDefinitionPtr view = GetViewDefinitionForName("FullView");
    ASSERT_TRUE(view);
    EXPECT_EQ(U8(ViewDefinitionSource(view)), Path(full / "view" / "v.xml"));
    ASSERT_EQ(view->items.size(), 1u);
    EXPECT_EQ(U8(view->items[0]->GetLabel()), "Regal");
    EXPECT_TRUE(NamespaceDefinition("http://example.com/full/"));
    EXPECT_EQ(since.Texts(),
              (std::vector<std::string>{
                  kManifestParsing + std::string("localization directory is missing from extension package."),
                  kManifestParsing + std::string("neither schema nor view file is present in extension package.")}));
    const auto infos = since.New();
    ASSERT_EQ(infos.size(), 2u);
    EXPECT_EQ(U8(infos[0].source), Path(noLoc / "loc"));
    EXPECT_EQ(U8(infos[1].source), Path(packages / "TextOnly"));
  }
  ovracore::ClearDictionaries();
  fs::remove_all(packages);
}

TEST_F(ExtensionPackages, AWrittenManifestReadsBackWithItsValuesEscaped) {
  GenericPanelManifestParser::ManifestInfo panel;
  panel.name = u"Tom & Jerry's \"Archive\" <\u00e9t\u00e9>";
  panel.version = u"2.5";
  panel.localizationFile = u"archive";
  panel.label = u"not written";
  const fs::path path = dir / "new/folder/manifest.xml";
  ASSERT_TRUE(WriteExtensionManifest(panel, U16(path.string())));
  EXPECT_EQ(ovratest::ReadFile(path).rfind("<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n<extension xmlns=", 0), 0u);
  ExtensionManifestParser::ManifestInfo info;
  ASSERT_TRUE(ParseExtensionManifestFromDocument(U16(path.string()), info));
  EXPECT_EQ(info.name, panel.name);
  EXPECT_EQ(info.version, u"2.5");
  EXPECT_EQ(info.locFilePrefix, u"archive");

  // A folder that cannot be made: nothing written.
  ovratest::WriteFile(dir / "blocker", "");
  EXPECT_FALSE(WriteExtensionManifest(panel, U16((dir / "blocker/sub/manifest.xml").string())));
}

}  // namespace
