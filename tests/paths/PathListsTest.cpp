// Path lists written and read back, and which properties panels show.
#include <set>

#include "MetadataTestSupport.h"
#include "TestSupport.h"

namespace ovrametadata {
namespace {

const char* const kDC = "http://purl.org/dc/elements/1.1/";
const char* const kIptc = "http://iptc.org/std/Iptc4xmpCore/1.0/xmlns/";

class PathLists : public ::testing::Test {
 protected:
  ovratest::LibraryScope library;
};

TEST_F(PathLists, TheDocumentIsWrittenExactlyAndReadsBackItsLeaves) {
  UTF8String text;
  IncludedLeafPathsAsXMLString({}, text);
  EXPECT_EQ(text, "<?xml version='1.0'?>\n<md.paths version='1.0'>\n</md.paths>\n");

  const Path title = ovratest::PathOf(kDC, "title");
  const Path contact = ovratest::PathOf(kIptc, "CreatorContactInfo");
  const Path city = CreatePathFromStructureField(
      contact, FieldNameDefinition(TypeEntryDefinition(contact), "CiAdrCity"));
  ASSERT_FALSE(city.description.empty());
  PathAsXMLFragment(text, title);
  EXPECT_EQ(text, "<metadata_path><internal>false</internal>\n<namespace>http://purl.org/dc/elements/1.1/</namespace>\n"
                  "<description>title</description>\n<entry_name>title</entry_name>\n"
                  "<parent_id>http://purl.org/dc/elements/1.1/</parent_id>\n</metadata_path>\n");

  // Written and read: leaves come back; a structure (no leaf), a property
  // that no longer exists and a namespace with an ampersand are dropped
  // silently; the ampersand is escaped on the way.
  Path gone = title;
  gone.description = gone.entry_name = "vanished";
  Path odd = title;
  odd.namespaceURI = odd.parent_id = "http://example.com/a&b/";
  IncludedLeafPathsAsXMLString({title, city, contact, gone, odd}, text);
  EXPECT_NE(text.find("<namespace>http://example.com/a&amp;b/</namespace>"), std::string::npos);
  std::set<Path> read;
  EXPECT_TRUE(ReadIncludedLeafPathsAsXMLString(read, text));
  ASSERT_EQ(read.size(), 2u);
  EXPECT_EQ(read.begin()->description, city.description);
  EXPECT_EQ(read.begin()->entry_name, "CiAdrCity");
  EXPECT_EQ(read.rbegin()->description, "title");

  ovratest::TempDir dir;
  ovratest::WriteFile(dir / "list.xml", text);
  std::set<Path> fromFile;
  EXPECT_TRUE(ReadIncludedLeafPathsAsXMLFile(fromFile, ovratest::U16((dir / "list.xml").string())));
  EXPECT_EQ(fromFile.size(), 2u);
  std::set<Path> none;
  EXPECT_FALSE(ReadIncludedLeafPathsAsXMLString(none, "<md.paths><metadata_path>"));
  EXPECT_FALSE(ReadIncludedLeafPathsAsXMLFile(none, ovratest::U16((dir / "missing.xml").string())));
  EXPECT_TRUE(none.empty());
}

TEST_F(PathLists, BlockedAndUnshowableProperties) {
  const Path title = ovratest::PathOf(kDC, "title");
  EXPECT_TRUE(IsPropertyUISupported(title));
  Path sameLocation = title;
  sameLocation.entry_name = "other";
  BlacklistPropertyForClient(title, true);
  EXPECT_TRUE(IsPropertyBlacklistedByClient(sameLocation));
  EXPECT_FALSE(IsPropertyUISupported(title));
  BlacklistPropertyForClient(sameLocation, false);
  EXPECT_TRUE(IsPropertyUISupported(title));

  const Path toneCurve = ovratest::PathOf("http://ns.adobe.com/camera-raw-settings/1.0/", "ToneCurve");
  EXPECT_TRUE(IsPropertyBlacklistedInternally(toneCurve));
  EXPECT_FALSE(IsPropertyUISupported(toneCurve));
  Path elsewhere = toneCurve;
  elsewhere.namespaceURI = kDC;
  EXPECT_FALSE(IsPropertyBlacklistedInternally(elsewhere));

  // A choice of dates cannot be shown as one value; a choice of text can.
  ovratest::InitializeWithDefinitions(R"(<xmp_definitions>
    <xmp_schema namespace="http://example.com/ui/" prefix="ui" label="UI">
      <xmp_property name="When" type="closedchoice" element_type="date" label="When"/>
      <xmp_property name="Mood" type="openchoice" element_type="text" label="Mood"/>
    </xmp_schema></xmp_definitions>)",
                                      "http://example.com/ui/");
  EXPECT_FALSE(IsPropertyUISupported(ovratest::PathOf("http://example.com/ui/", "When")));
  EXPECT_TRUE(IsPropertyUISupported(ovratest::PathOf("http://example.com/ui/", "Mood")));
  Terminate();
}

}  // namespace
}  // namespace ovrametadata
