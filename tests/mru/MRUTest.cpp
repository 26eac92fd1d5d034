// Recently used values: the file byte for byte, its round trip, and files
// that must not cost the lists in memory.
#include <ovrametadata/MRU.h>

#include "MetadataTestSupport.h"
#include "TestSupport.h"

namespace ovrametadata {
namespace {

namespace fs = std::filesystem;

class MRU : public ::testing::Test {
 protected:
  void SetUp() override {
    ClearMRUList();
    RemoveMRUFile();
  }
  void TearDown() override {
    ClearMRUList();
    RemoveMRUFile();
  }
  fs::path File() const { return fs::path(ovratest::U8(MRUDirectory())) / "PropsheetMRU.xml"; }
};

TEST_F(MRU, TheFileHoldsEveryListInKeyOrderAndReadsBackUnchanged) {
  EXPECT_EQ(ovratest::U8(MRUDirectory()), (ovratest::TestRoot() / "user/Orlex/XMP/Propsheet/").string());
  ASSERT_TRUE(SerializeMRUList());
  EXPECT_EQ(ovratest::ReadFile(File()),
            "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
            "<xps:propsheet xmlns:xps=\"http://ns.ovrametadata.org/xmp/propsheet/\"><xps:mruLists/></xps:propsheet>");

  UpdateMRULists("xmp:Label", {u"Red", u"Blue"});
  UpdateMRULists("dc:title", {u"Caf\u00e9 <&> \"\u6e2f\"", u""});
  UpdateMRULists("xmp:Label", {u"Green"});
  ASSERT_TRUE(SerializeMRUList());
  EXPECT_EQ(ovratest::ReadFile(File()),
            "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
            "<xps:propsheet xmlns:xps=\"http://ns.ovrametadata.org/xmp/propsheet/\"><xps:mruLists>"
            "<xps:mruList key=\"dc:title\"><item>Caf\xC3\xA9 &lt;&amp;&gt; &quot;\xE6\xB8\xAF&quot;</item><item/>"
            "</xps:mruList><xps:mruList key=\"xmp:Label\"><item>Green</item></xps:mruList>"
            "</xps:mruLists></xps:propsheet>");
  const MRULists saved = GetMRULists();
  ClearMRUList();
  EXPECT_TRUE(GetMRULists().empty());
  LoadMRUFile();
  EXPECT_EQ(GetMRULists(), saved);

  EXPECT_TRUE(RemoveMRUFile());
  EXPECT_FALSE(RemoveMRUFile());
}

TEST_F(MRU, ABadFileNeverCostsTheListsInMemory) {
  UpdateMRULists("dc:title", {u"kept"});
  const MRULists before = GetMRULists();
  fs::create_directories(File().parent_path());
  for (const char* bad : {"", "<xps:propsheet><xps:mruLists><xps:mruList key=\"dc:title\"><item>cut",
                          "<other/>", "\xFF\xFE not xml", "<xps:propsheet/>"}) {
    ovratest::WriteFile(File(), bad);
    LoadMRUFile();
    EXPECT_EQ(GetMRULists(), before) << bad;
  }
  // A file that cannot be read.
  fs::remove(File());
  fs::create_directories(File());
  LoadMRUFile();
  EXPECT_EQ(GetMRULists(), before);
  EXPECT_FALSE(SerializeMRUList());
  fs::remove(File());
}

}  // namespace
}  // namespace ovrametadata
