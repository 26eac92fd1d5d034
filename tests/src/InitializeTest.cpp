#include <filesystem>

#include <ovracore/FileSupport.h>
#include <ovracore/Localizer.h>

#include "InitializeInternal.h"
#include "MetadataTestSupport.h"
#include "TestSupport.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;
using ovratest::U16;
using ovratest::U8;
namespace fs = std::filesystem;

namespace {

std::string SchemaFile(const std::string& ns, const std::string& prefix, const std::string& properties = "") {
  return "<xmp_definitions><xmp_schema namespace=\"" + ns + "\" prefix=\"" + prefix + "\">" + properties +
         "</xmp_schema></xmp_definitions>\n";
}

bool Contains(const Range<SchemaDefinitionPtr>& schemas, const SchemaDefinitionPtr& schema) {
  return std::find(schemas.begin(), schemas.end(), schema) != schemas.end();
}

// Every test starts with empty custom folders and leaves none behind, as
// the folders are shared by the whole test process.
class StartUp : public ::testing::Test {
 protected:
  StartUp() : user(U8(CustomDefinitionsUserDirectory())), global(U8(CustomDefinitionsGlobalDirectory())) {
    RemoveFolders();
  }
  ~StartUp() override { RemoveFolders(); }

  void RemoveFolders() {
    fs::remove_all(user);
    fs::remove_all(global);
  }
  std::u16string Path(const fs::path& file) { return U16(file.lexically_normal().string()); }

  const fs::path user;
  const fs::path global;
};

TEST_F(StartUp, DefinitionsLiveUntilTheLastTerminate) {
  ovratest::WriteFile(user / "Keep.xml", SchemaFile("http://example.com/startup/keep/", "sKeep"));
  int calls = 0;
  auto withdrawn = boost::make_shared<ErrorCallback>([&](const std::u16string&) { ++calls; });
  auto active = boost::make_shared<ErrorCallback>([&](const std::u16string&) { ++calls; });

  Initialize();
  Initialize();
  NotifyOnError(withdrawn);
  NotifyOnError(active);
  withdrawn->clear();
  const long withdrawnHeld = withdrawn.use_count();
  const long activeHeld = active.use_count();

  Terminate();
  EXPECT_TRUE(TypeIdDefinition("text"));
  EXPECT_TRUE(NamespaceDefinition("http://example.com/startup/keep/"));
  EXPECT_FALSE(CommonSchemaDefinitions().empty());
  // The first Terminate only drops withdrawn callbacks.
  EXPECT_EQ(withdrawn.use_count(), withdrawnHeld - 1);
  EXPECT_EQ(active.use_count(), activeHeld);
  SendError(kPlainError, u"still heard", u"");
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(HasErrors());

  Terminate();
  EXPECT_FALSE(TypeIdDefinition("text"));
  EXPECT_FALSE(NamespaceDefinition("http://example.com/startup/keep/"));
  EXPECT_TRUE(CommonSchemaDefinitions().empty());
  EXPECT_TRUE(StandardSchemaNamespace(kStandardSchema_dc).empty());
  EXPECT_TRUE(allSchemasFromSourceFile(Path(user / "Keep.xml")).empty());
  EXPECT_FALSE(HasErrors());
  EXPECT_EQ(active.use_count(), activeHeld - 1);

  // A later Initialize loads everything again.
  ovratest::LibraryScope again;
  EXPECT_TRUE(NamespaceDefinition("http://example.com/startup/keep/"));
}

TEST_F(StartUp, DICOMAndMobileAreSkippedOnlyInTheGlobalFolder) {
  ovratest::WriteFile(global / "DICOM.xml", SchemaFile("http://example.com/startup/gdicom/", "sgd"));
  ovratest::WriteFile(global / "Mobile.xml", SchemaFile("http://example.com/startup/gmobile/", "sgm"));
  ovratest::WriteFile(global / "Other.xml", SchemaFile("http://example.com/startup/gother/", "sgo"));
  ovratest::WriteFile(user / "DICOM.xml", SchemaFile("http://example.com/startup/udicom/", "sud"));
  ovratest::LibraryScope library;
  EXPECT_FALSE(NamespaceDefinition("http://example.com/startup/gdicom/"));
  EXPECT_FALSE(NamespaceDefinition("http://example.com/startup/gmobile/"));
  EXPECT_TRUE(NamespaceDefinition("http://example.com/startup/gother/"));
  const auto userDICOM = NamespaceDefinition("http://example.com/startup/udicom/");
  ASSERT_TRUE(userDICOM);
  EXPECT_EQ(filePathForSchema(userDICOM), Path(user / "DICOM.xml"));
}

TEST_F(StartUp, CustomFilesAreClassifiedAndFiledByPath) {
  ovratest::WriteFile(user / "Custom.xml",
                      "<xmp_definitions>"
                      "<xmp_type name=\"sCustomType\" extends=\"integer\"/>"
                      "<xmp_schema namespace=\"http://example.com/startup/common/\" prefix=\"sc\">"
                      "<xmp_property name=\"n\" type=\"sCustomType\"/></xmp_schema>"
                      "<xmp_schema namespace=\"http://example.com/startup/dyn/\" prefix=\"sdyn\" "
                      "dynamic=\"true\"/>"
                      "</xmp_definitions>");
  ovratest::WriteFile(user / "Upper.XML", SchemaFile("http://example.com/startup/upper/", "su"));
  ovratest::WriteFile(user / "notes.txt", SchemaFile("http://example.com/startup/txt/", "st"));
  ovratest::LibraryScope library;

  const auto common = NamespaceDefinition("http://example.com/startup/common/");
  const auto dynamic = NamespaceDefinition("http://example.com/startup/dyn/");
  ASSERT_TRUE(common);
  ASSERT_TRUE(dynamic);
  EXPECT_TRUE(common->isCustom);
  EXPECT_FALSE(dynamic->isCustom);
  EXPECT_TRUE(Contains(CommonSchemaDefinitions(), common));
  EXPECT_FALSE(Contains(CommonSchemaDefinitions(), dynamic));
  EXPECT_TRUE(Contains(DynamicSchemaDefinitions(), dynamic));

  const std::u16string path = Path(user / "Custom.xml");
  EXPECT_EQ(allSchemasFromSourceFile(path).size(), 2u);
  ASSERT_EQ(allTypesFromSourceFile(path).size(), 1u);
  EXPECT_EQ(allTypesFromSourceFile(path)[0], TypeIdDefinition("sCustomType"));
  EXPECT_FALSE(NamespaceDefinition("http://example.com/startup/upper/"));
  EXPECT_FALSE(NamespaceDefinition("http://example.com/startup/txt/"));
}

TEST_F(StartUp, LocDictionaryTranslatesTheLabelsOfItsFile) {
  auto titled = [](const std::string& title) {
    return "<xmp_property name=\"title\" type=\"text\" label=\"$$$/startuptest/" + title +
           "/title=Default " + title + "\"/>";
  };
  ovratest::WriteFile(user / "Labels.xml", SchemaFile("http://example.com/startup/labels/", "slab", titled("Labels")));
  ovratest::WriteFile(user / "Plain.xml", SchemaFile("http://example.com/startup/plain/", "splain", titled("Plain")));
  ovratest::WriteFile(user / "loc" / ("Labels_" + ovracore::ApplicationLanguage() + ".dat"),
                      "# dictionary of Labels.xml\n$$$/startuptest/Labels/title=Translated Labels\n");
  ovratest::WriteFile(user / "loc" / "Plain_xx_XX.dat", "$$$/startuptest/Plain/title=Wrong language\n");
  ovratest::LibraryScope library;

  const auto labels = NamespaceDefinition("http://example.com/startup/labels/");
  const auto plain = NamespaceDefinition("http://example.com/startup/plain/");
  ASSERT_TRUE(labels && plain);
  EXPECT_EQ(U8(labels->properties.at(0)->label), "Translated Labels");
  EXPECT_EQ(U8(labels->properties.at(0)->labelSource), "$$$/startuptest/Labels/title=Default Labels");
  EXPECT_EQ(U8(plain->properties.at(0)->label), "Default Plain");
}

TEST_F(StartUp, CustomFilesNeverMergeIntoRegisteredSchemas) {
  const std::string ns = "http://example.com/startup/dup/";
  ovratest::WriteFile(global / "First.xml",
                      SchemaFile(ns, "sdup", "<xmp_property name=\"a\" type=\"text\"/>"));
  ovratest::WriteFile(user / "Second.xml",
                      SchemaFile(ns, "sdup", "<xmp_property name=\"b\" type=\"text\"/>"));
  ovratest::WriteFile(user / "Dublin.xml",
                      SchemaFile("http://purl.org/dc/elements/1.1/", "dc",
                                 "<xmp_property name=\"extraDc\" type=\"text\"/>"));
  ErrorsSince since;
  ovratest::LibraryScope library;

  const auto schema = NamespaceDefinition(ns);
  ASSERT_TRUE(schema);
  ASSERT_EQ(schema->properties.size(), 1u);
  EXPECT_EQ(schema->properties[0]->name, "a");
  EXPECT_EQ(filePathForSchema(schema), Path(global / "First.xml"));
  EXPECT_TRUE(allSchemasFromSourceFile(Path(user / "Second.xml")).empty());
  EXPECT_FALSE(PropertyNameDefinition(NamespaceDefinition("http://purl.org/dc/elements/1.1/"), "extraDc"));

  // The user folder is read in name order: Dublin.xml, then Second.xml.
  std::vector<std::pair<std::string, std::string>> duplicates;
  for (const auto& error : since.New()) {
    if (U8(error.message).find("already exists") == std::string::npos) continue;
    EXPECT_EQ(error.type, kDefinitionRegistrationError);
    duplicates.emplace_back(U8(error.message), U8(error.source));
  }
  EXPECT_EQ(duplicates,
            (std::vector<std::pair<std::string, std::string>>{
                {"Error registering definition: schema definition for \"http://purl.org/dc/elements/1.1/\" "
                 "already exists.",
                 U8(Path(user / "Dublin.xml"))},
                {"Error registering definition: schema definition for \"http://example.com/startup/dup/\" "
                 "already exists.",
                 U8(Path(user / "Second.xml"))}}));
}

TEST_F(StartUp, PackageSchemaFilesMergeAndAreNeverCustom) {
  ovratest::LibraryScope library;
  ovratest::TempDir package;
  const std::string dcNs = "http://purl.org/dc/elements/1.1/";
  const auto dc = NamespaceDefinition(dcNs);
  ASSERT_TRUE(dc);
  const auto commonBefore = boost::distance(CommonSchemaDefinitions());
  ovratest::WriteFile(package / "schema.xml",
                      SchemaFile(dcNs, "dc", "<xmp_property name=\"pkgExtra\" type=\"text\"/>") +
                          SchemaFile("http://example.com/startup/pkg/", "spkg"));
  LoadDefinitionsFromFile(ovracore::filesupport::File(U16((package / "schema.xml").string())), false);
  EXPECT_TRUE(PropertyNameDefinition(dc, "pkgExtra"));
  // A merging load lists no schema as new, even the one that registered.
  EXPECT_EQ(boost::distance(CommonSchemaDefinitions()), commonBefore);
}

TEST_F(StartUp, MakerSchemasInCustomFilesAreNotCustom) {
  ovratest::LibraryScope library;
  const std::string dicomNs = "http://ns.ovrametadata.org/DICOM/";
  const auto builtIn = NamespaceDefinition(dicomNs);
  ASSERT_TRUE(builtIn);
  RemoveSchemaDefinition(builtIn);
  ovratest::TempDir folder;
  ovratest::WriteFile(folder / "dicom.xml", SchemaFile(dicomNs, builtIn->prefix));
  LoadDefinitionsFromFile(ovracore::filesupport::File(U16((folder / "dicom.xml").string())), true);
  const auto reloaded = NamespaceDefinition(dicomNs);
  ASSERT_TRUE(reloaded);
  EXPECT_NE(reloaded, builtIn);
  EXPECT_FALSE(reloaded->isCustom);
  EXPECT_TRUE(Contains(CommonSchemaDefinitions(), reloaded));
}

TEST_F(StartUp, MissingResourcesAndFoldersAreSkippedSilently) {
  ovratest::LibraryScope library;
  ErrorsSince since;
  const DefinitionsPair none = LoadDefinitionsFromResource(u"no_such_definitions");
  EXPECT_TRUE(none.first.empty() && none.second.empty());
  LoadDefinitionsDirectory(u"", {});
  LoadDefinitionsDirectory(U16((user / "missing").string()), {});
  since.ExpectNone();
}

}  // namespace
