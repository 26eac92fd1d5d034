#include <cstdlib>
#include <filesystem>

#include <ovracore/FileSupport.h>

#include "MetadataTestSupport.h"
#include "TestSupport.h"

using namespace ovrametadata;
namespace fs = std::filesystem;

namespace {

std::u16string Expected(const char* rootVariable, const std::string& relative) {
  return ovratest::U16((fs::path(std::getenv(rootVariable)) / relative).lexically_normal().string());
}

TEST(Folders, CustomDefinitionFoldersDifferOnlyInTheRoot) {
  const std::string relative = "Orlex/XMP/Custom Propsheet Panels/4.0/custom";
  EXPECT_EQ(CustomDefinitionsUserDirectory(), Expected("OVRAMETADATA_USER_ROOT", relative));
  EXPECT_EQ(CustomDefinitionsGlobalDirectory(), Expected("OVRAMETADATA_LOCAL_ROOT", relative));
  EXPECT_NE(CustomDefinitionsUserDirectory(), CustomDefinitionsGlobalDirectory());
  // Asking creates nothing.
  EXPECT_FALSE(fs::exists(ovratest::U8(CustomDefinitionsUserDirectory())));
  EXPECT_FALSE(fs::exists(ovratest::U8(PanelsDefinitionsGlobalDirectory(kPanelsVersion4))));
}

TEST(Folders, PanelFoldersFollowTheLayoutVersion) {
  const std::string base = "Orlex/XMP/Custom Propsheet Panels/";
  const std::pair<VelkVersion, const char*> versions[] = {{kPanelsVersion4, "4.0/panels"},
                                                          {kPanelsVersion3, "3.0/panels"},
                                                          {kPanelsVersion2, "2.0/panels"},
                                                          {static_cast<VelkVersion>(7), "2.0/panels"}};
  for (const auto& [version, folder] : versions) {
    EXPECT_EQ(PanelsDefinitionsUserDirectory(version), Expected("OVRAMETADATA_USER_ROOT", base + folder));
    EXPECT_EQ(PanelsDefinitionsGlobalDirectory(version), Expected("OVRAMETADATA_LOCAL_ROOT", base + folder));
  }
}

TEST(Folders, UnusableRootGivesEmptyPaths) {
  ovratest::ScopedEnv noUserRoot("OVRAMETADATA_USER_ROOT", "");
  EXPECT_TRUE(CustomDefinitionsUserDirectory().empty());
  EXPECT_TRUE(PanelsDefinitionsUserDirectory(kPanelsVersion4).empty());
  EXPECT_FALSE(CustomDefinitionsGlobalDirectory().empty());
}

TEST(Folders, XMPFilesPluginsLieBelowTheApplicationPluginFolder) {
  ovratest::TempDir plugins;
  ovracore::filesupport::SetPluginsFolder(ovratest::U16(plugins.path().string()));
  EXPECT_EQ(XMPFilesPluginsDirectory(),
            ovratest::U16((plugins.path() / "XMPFiles").lexically_normal().string()));
  // Back to the default folder beside the library.
  ovracore::filesupport::SetPluginsFolder(u"");
}

TEST(Folders, OnlyDICOMAndMobileAreExcludedFromTheGlobalFolder) {
  EXPECT_TRUE(IsSchemaExcludedFromGlobal(u"DICOM.xml"));
  EXPECT_TRUE(IsSchemaExcludedFromGlobal(u"Mobile.xml"));
  for (const char16_t* name : {u"dicom.xml", u"Mobile.XML", u"DICOM", u"Other.xml"})
    EXPECT_FALSE(IsSchemaExcludedFromGlobal(name)) << ovratest::U8(name);
}

}  // namespace
