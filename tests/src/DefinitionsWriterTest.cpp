// Definitions written back read as they were: the built-in files, a custom
// file with awkward texts, and a file rewritten after one of its schemas was
// edited.
#include <ovrametadata/Views.h>

#include "InitializeInternal.h"
#include "MetadataTestSupport.h"
#include "TestSupport.h"

using namespace ovrametadata;
using ovratest::Describe;
using ovratest::ErrorsSince;
using ovratest::U16;
using ovratest::U8;

namespace {

DefinitionsPair RoundTrip(const DefinitionsPair& pair) {
  return ParseBufferForDefinitions(
      WriteDefinitionsToBuffer(Range<SchemaDefinitionPtr>(pair.first), Range<TypeDefinitionPtr>(pair.second)),
      u"written");
}

TEST(DefinitionsWriter, EveryBuiltInFileReadsBackAsItWasRead) {
  ErrorsSince since;
  std::size_t files = 0;
  for (const UTF8String& name : ovrametadataResources().List("xml")) {
    if (!IsNotViewDefinition(U16(name))) continue;
    const DefinitionsPair read =
        ParseBufferForDefinitions(UTF8String(*ovrametadataResources().Read(name, "xml")), U16(name));
    EXPECT_EQ(Describe(RoundTrip(read), false), Describe(read, false)) << name;
    ++files;
  }
  EXPECT_GT(files, 20u);
  since.ExpectNone();
}

TEST(DefinitionsWriter, AwkwardTextsNumbersAndChoicesReadBack) {
  const char* const custom = R"(<?xml version="1.0" encoding="UTF-8"?>
<xmp_definitions xmlns:ui="http://ns.ovrametadata.org/xmp/propsheet/ui/">
  <xmp_schema namespace="http://example.com/w/" prefix="w" label="$$$/w/schema=Tom &amp; &quot;Jerry&quot; &lt;caf&#xE9;&gt;"
              description="Line one&#10;line two">
    <xmp_property name="Grade" type="closedchoice" element_type="text" label="Note" ui:multiLine="true">
      <xmp_choice raw_value="a&amp;b" label="$$$/w/ab=A &amp; B"/>
    </xmp_property>
    <xmp_property name="Ratio" type="real" min="-0.1" max="1e+300" category="internal" label="Ratio"/>
    <xmp_property name="Old" type="text" deprecated="true" label="Old">
      <xmp_qualifier namespace="http://example.com/q/" prefix="q" name="lang" type="text" label="Language"/>
    </xmp_property>
  </xmp_schema>
  <xmp_schema namespace="http://example.com/empty/" prefix="e" label="Empty"/>
  <xmp_type name="wPair" label="Pair">
    <xmp_field namespace="http://example.com/w/" prefix="w" name="left" type="integer" label="Left"/>
  </xmp_type>
  <xmp_type name="wCode" type="text" pattern="[A-Z]{2}" label="Code"/>
</xmp_definitions>)";
  ErrorsSince since;
  const DefinitionsPair read = ParseBufferForDefinitions(custom, u"custom");
  const UTF8String written =
      WriteDefinitionsToBuffer(Range<SchemaDefinitionPtr>(read.first), Range<TypeDefinitionPtr>(read.second));
  since.ExpectNone();
  const DefinitionsPair back = ParseBufferForDefinitions(written, u"written");
  EXPECT_EQ(Describe(back, false), Describe(read, false));
  // A schema without properties keeps its closing tag; hints are not written.
  for (const char* piece : {"<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n<xmp_definitions>\n",
                            "\t<xmp_schema namespace=\"http://example.com/empty/\" prefix=\"e\" "
                            "label=\"Empty\">\n\t</xmp_schema>\n",
                            "\t\t\t<xmp_choice raw_value=\"a&amp;b\"", "label=\"Ratio\" max=\"1e+300\" min=\"-0.1\" />"})
    EXPECT_NE(written.find(piece), std::string::npos) << piece << "\n" << written;
  EXPECT_EQ(written.find("multiLine"), std::string::npos);
  EXPECT_EQ(back.first[0]->properties[1]->constraints.max, boost::make_optional(1e300));

  // A choice list always reads back with an element type; a false
  // deprecation reads back as none.
  const DefinitionsPair loose = ParseBufferForDefinitions(R"(<xmp_definitions>
    <xmp_schema namespace="http://example.com/l/" prefix="l" label="L">
      <xmp_property name="c" type="closedchoice" deprecated="false" label="C"><xmp_choice raw_value="1" label="One"/>
      </xmp_property></xmp_schema></xmp_definitions>)",
                                                          u"loose");
  const DefinitionsPair looseBack = RoundTrip(loose);
  const auto& c = *looseBack.first.at(0)->properties.at(0);
  EXPECT_EQ(c.constraints.elementType, boost::make_optional(std::string("text")));
  EXPECT_FALSE(c.constraints.deprecated);
}

TEST(DefinitionsWriter, RewritingOneSchemaOfAFileKeepsItsNeighbours) {
  ovratest::LibraryScope library;
  ovratest::TempDir dir;
  const std::string path = (dir / "two.xml").string();
  ovratest::WriteFile(path, R"(<xmp_definitions>
    <xmp_schema namespace="http://example.com/one/" prefix="one" label="One">
      <xmp_property name="a" type="oneKind" label="A"/></xmp_schema>
    <xmp_schema namespace="http://example.com/two/" prefix="two" label="Two">
      <xmp_property name="b" type="text" label="B"/></xmp_schema>
    <xmp_type name="oneKind" type="text" label="Kind"/>
  </xmp_definitions>)");
  LoadDefinitionsFromFile(ovracore::filesupport::File(U16(path)), true);
  const SchemaDefinitionPtr one = NamespaceDefinition("http://example.com/one/");
  ASSERT_TRUE(one);
  one->properties[0]->labelSource = u"Renamed";
  RewriteSchemaFile(one);
  const DefinitionsPair back = ParseDocumentForDefinitions(U16(path));
  ASSERT_EQ(back.first.size(), 2u);
  EXPECT_EQ(U8(back.first[0]->properties[0]->labelSource), "Renamed");
  EXPECT_EQ(back.first[1]->prefix, "two");
  ASSERT_EQ(back.second.size(), 1u);
  EXPECT_EQ(back.second[0]->name, "oneKind");

  // A folder that cannot be made: false, and nothing is written.
  ovratest::WriteFile(dir / "file", "");
  EXPECT_FALSE(WriteSchemaFile(back, U16((dir / "file/sub/x.xml").string())));
}

}  // namespace
