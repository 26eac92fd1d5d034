#include <ovracore/Localizer.h>

#include "MetadataTestSupport.h"
#include "TestSupport.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;
using ovratest::U8;

namespace {

const std::u16string kSource = u"/defs/parser.xml";
const std::string kParsing = "Error parsing definitions file: ";
using Text = boost::optional<std::string>;

std::string Document(const std::string& body) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
         "<xmp_definitions xmlns:ui=\"http://ns.ovrametadata.org/xmp/propsheet/ui/\">\n" +
         body + "\n</xmp_definitions>\n";
}

TEST(DefinitionsParser, ReadsEveryAttributeOfSchemasPropertiesAndTypes) {
  ErrorsSince since;
  const auto result = ParseBufferForDefinitions(Document(R"(
    <xmp_schema namespace="http://example.com/p/" prefix="pp" label="Parsed"
                description="A &amp;amp; B" dynamic="true">
      <xmp_property name="rating" type="closedchoice" element_type="integer" category="internal"
                    min="-1" max="5" pattern="[0-9]" deprecated="true" label="Rating"
                    ui:multiLine="true">
        <xmp_choice raw_value="1" label="One"/>
        <xmp_choice raw_value="2"/>
      </xmp_property>
      <xmp_property name="notes" type="text" max="lots"/>
    </xmp_schema>
    <xmp_type name="pPoint" label="" description="Point">
      <xmp_field name="x" type="real" namespace="http://example.com/pt/" prefix="pt"/>
    </xmp_type>)"),
                                                kSource);
  since.ExpectNone();
  ASSERT_EQ(result.first.size(), 1u);
  const auto& schema = *result.first[0];
  EXPECT_EQ(schema.namespaceURI, "http://example.com/p/");
  EXPECT_EQ(schema.prefix, "pp");
  EXPECT_EQ(U8(schema.label), "Parsed");
  // Values pass through the reserved-character decoding once more.
  EXPECT_EQ(U8(schema.description), "A & B");
  EXPECT_TRUE(schema.isDynamic);
  EXPECT_TRUE(schema.isCustom);
  ASSERT_EQ(schema.properties.size(), 2u);

  const auto& rating = *schema.properties[0];
  EXPECT_EQ(rating.name, "rating");
  EXPECT_EQ(rating.type, Text("closedchoice"));
  EXPECT_EQ(rating.constraints.elementType, Text("integer"));
  EXPECT_TRUE(rating.isInternal);
  EXPECT_EQ(rating.constraints.min, boost::make_optional(-1.0));
  EXPECT_EQ(rating.constraints.max, boost::make_optional(5.0));
  EXPECT_EQ(rating.constraints.pattern, Text("[0-9]"));
  EXPECT_EQ(rating.constraints.deprecated, boost::make_optional(true));
  ASSERT_TRUE(rating.uiHints);
  EXPECT_FALSE(rating.uiHints->separatorAfter);
  EXPECT_TRUE(rating.uiHints->multiLine);
  ASSERT_EQ(rating.constraints.choices.size(), 2u);
  EXPECT_EQ(rating.constraints.choices[0]->rawValue, "1");
  EXPECT_EQ(U8(rating.constraints.choices[0]->label), "One");
  EXPECT_EQ(U8(rating.constraints.choices[1]->label), "2");
  EXPECT_TRUE(rating.constraints.choices[1]->labelSource.empty());

  const auto& notes = *schema.properties[1];
  EXPECT_FALSE(notes.isInternal);
  EXPECT_FALSE(notes.constraints.max);
  EXPECT_FALSE(notes.constraints.deprecated);
  EXPECT_FALSE(notes.uiHints);
  EXPECT_EQ(U8(notes.label), "notes");

  ASSERT_EQ(result.second.size(), 1u);
  const auto& point = *result.second[0];
  EXPECT_EQ(point.name, "pPoint");
  EXPECT_FALSE(point.type);
  EXPECT_EQ(U8(point.label), "pPoint");
  ASSERT_EQ(point.fields.size(), 1u);
  EXPECT_EQ(point.fields[0]->namespaceURI, "http://example.com/pt/");
  EXPECT_EQ(point.fields[0]->prefix, "pt");
  EXPECT_EQ(point.fields[0]->type, Text("real"));
}

TEST(DefinitionsParser, LabelsAreLocalisedAndTheirSourcesKept) {
  ovracore::AddDictionaryEntry("$$$/parsertest/label", "Übersetzt");
  const auto result = ParseBufferForDefinitions(
      Document(R"(<xmp_schema namespace="http://example.com/loc/" prefix="loc">
                    <xmp_property name="p" type="text" label="$$$/parsertest/label=Default"
                                  description="$$$/parsertest/none=Fallback #{quot}q#{quot}"/>
                  </xmp_schema>)"),
      kSource);
  ASSERT_EQ(result.first.size(), 1u);
  EXPECT_EQ(U8(result.first[0]->label), "loc");  // no label: the prefix
  const auto& property = *result.first[0]->properties.at(0);
  EXPECT_EQ(U8(property.label), "Übersetzt");
  EXPECT_EQ(U8(property.labelSource), "$$$/parsertest/label=Default");
  EXPECT_EQ(U8(property.description), "Fallback \"q\"");
  EXPECT_EQ(U8(property.descriptionSource), "$$$/parsertest/none=Fallback #{quot}q#{quot}");
}

TEST(DefinitionsParser, ContainersStayCurrentUntilReplacedInDocumentOrder) {
  const auto result = ParseBufferForDefinitions(Document(R"(
    <xmp_schema namespace="http://example.com/first/" prefix="f1"/>
    <xmp_property name="afterClose" type="text"/>
    <xmp_choice raw_value="c1"/>
    <xmp_qualifier name="q" type="text" namespace="http://example.com/q/" prefix="q"/>
    <xmp_choice raw_value="qc"/>
    <xmp_qualifier name="q2" type="text"/>
    <xmp_schema namespace="http://example.com/second/" prefix="f2"/>
    <xmp_property name="inSecond" type="text"/>
    <ui:separator/>
    <xmp_property name="last" type="text" ui:multiLine="true"/>
    <ui:separator/>
    <ui:unknown/>)"),
                                                kSource);
  ASSERT_EQ(result.first.size(), 2u);
  const auto& first = *result.first[0];
  ASSERT_EQ(first.properties.size(), 1u);
  const auto& afterClose = *first.properties[0];
  EXPECT_EQ(afterClose.name, "afterClose");
  ASSERT_EQ(afterClose.constraints.choices.size(), 1u);
  EXPECT_EQ(afterClose.constraints.choices[0]->rawValue, "c1");
  ASSERT_EQ(afterClose.constraints.qualifiers.size(), 2u);
  const auto& qualifier = *afterClose.constraints.qualifiers[0];
  EXPECT_EQ(qualifier.namespaceURI, "http://example.com/q/");
  ASSERT_EQ(qualifier.constraints.choices.size(), 1u);
  EXPECT_EQ(qualifier.constraints.choices[0]->rawValue, "qc");
  EXPECT_EQ(afterClose.constraints.qualifiers[1]->name, "q2");

  const auto& second = *result.first[1];
  ASSERT_EQ(second.properties.size(), 2u);
  EXPECT_EQ(second.properties[0]->uiHints->separatorAfter, true);
  EXPECT_EQ(second.properties[0]->uiHints->multiLine, false);
  EXPECT_EQ(second.properties[1]->uiHints->separatorAfter, true);
  EXPECT_EQ(second.properties[1]->uiHints->multiLine, true);
}

TEST(DefinitionsParser, MisplacedElementsAreReportedAndDropped) {
  ErrorsSince since;
  const auto result = ParseBufferForDefinitions(Document(R"(
    <xmp_property name="early" type="text"/>
    <ui:separator name="sep"/>
    <xmp_choice raw_value="x"/>
    <xmp_qualifier name="q"/>
    <xmp_schema namespace="http://example.com/s/" prefix="s"/>
    <ui:separator/>
    <xmp_field name="orphan" type="text"/>
    <xmp_unknown/>
    <other:thing xmlns:other="http://example.com/other/"/>)"),
                                                kSource);
  ASSERT_EQ(result.first.size(), 1u);
  EXPECT_TRUE(result.first[0]->properties.empty());
  since.Expect(kDefinitionParsingError, kSource,
               {kParsing + "invalid property tag \"early\".", kParsing + "invalid property tag \"sep\".",
                kParsing + "invalid choice tag.", kParsing + "invalid qualifier tag.",
                kParsing + "invalid field tag \"orphan\".", kParsing + "invalid definitions tag \"xmp_unknown\"."});
}

TEST(DefinitionsParser, DeprecatedAndExtendsRules) {
  ErrorsSince since;
  const auto result = ParseBufferForDefinitions(Document(R"(
    <xmp_type name="yes" deprecated="yes"/>
    <xmp_type name="empty" deprecated=""/>
    <xmp_type name="absent"/>
    <xmp_type name="str" extends="string"/>
    <xmp_type name="list" extends="seq"/>
    <xmp_type name="blank" extends=""/>)"),
                                                kSource);
  ASSERT_EQ(result.second.size(), 6u);
  EXPECT_EQ(result.second[0]->constraints.deprecated, boost::make_optional(false));
  EXPECT_EQ(result.second[1]->constraints.deprecated, boost::make_optional(false));
  EXPECT_FALSE(result.second[2]->constraints.deprecated);
  EXPECT_FALSE(result.second[3]->extends);
  EXPECT_EQ(result.second[4]->extends, boost::make_optional(kPrimitiveType_seq));
  EXPECT_FALSE(result.second[5]->extends);
  since.Expect(kDefinitionParsingError, u"", {kParsing + "Entry must extend valid primitive type"});
}

TEST(DefinitionsParser, MisspeltRootIsReportedAndItsChildrenRead) {
  ErrorsSince since;
  const auto result = ParseBufferForDefinitions(
      R"(<xmp_definition><xmp_type name="kept"/></xmp_definition>)", kSource);
  ASSERT_EQ(result.second.size(), 1u);
  EXPECT_EQ(result.second[0]->name, "kept");
  since.Expect(kDefinitionParsingError, kSource, {kParsing + "invalid definitions tag \"xmp_definition\"."});
}

TEST(DefinitionsParser, MalformedDocumentKeepsWhatCameBefore) {
  ErrorsSince since;
  const auto result = ParseBufferForDefinitions(
      "<xmp_definitions><xmp_type name=\"before\"/><xmp_type name=\"broken\"></xmp_definitions>"
      "<xmp_type name=\"after\"/>",
      kSource);
  ASSERT_EQ(result.second.size(), 2u);
  EXPECT_EQ(result.second[1]->name, "broken");
  since.Expect(kDefinitionParsingError, kSource, {kParsing + "invalid XML."});

  ErrorsSince empty;
  EXPECT_TRUE(ParseBufferForDefinitions("", u"empty").second.empty());
  empty.Expect(kDefinitionParsingError, u"empty", {kParsing + "invalid XML."});
}

TEST(DefinitionsParser, DocumentsAreReadFromFiles) {
  ovratest::TempDir dir;
  const auto path = dir / "defs.xml";
  ovratest::WriteFile(path, Document(R"(<xmp_type name="fromFile"/>)"));
  DefinitionsPair result;
  EXPECT_TRUE(ParseDocumentForDefinitions(ovratest::U16(path.string()), result));
  ASSERT_EQ(result.second.size(), 1u);
  EXPECT_EQ(ParseDocumentForDefinitions(ovratest::U16(path.string())).second.size(), 1u);

  ErrorsSince since;
  const std::u16string missing = ovratest::U16((dir / "missing.xml").string());
  DefinitionsPair none;
  EXPECT_FALSE(ParseDocumentForDefinitions(missing, none));
  since.Expect(kDefinitionParsingError, missing, {kParsing + "invalid XML."});
}

class ParseAndRegister : public ::testing::Test {
 protected:
  ovratest::LibraryScope library;
};

TEST_F(ParseAndRegister, TypesRegisterBeforeSchemasAndChecksRunAfterwards) {
  ErrorsSince since;
  const auto result = ParseBufferAndRegisterDefinitions(Document(R"(
    <xmp_schema namespace="http://example.com/order/" prefix="ord">
      <xmp_property name="pos" type="ordPoint"/>
      <xmp_property name="later" type="ordLater"/>
      <xmp_property name="bad" type="ordNothing"/>
    </xmp_schema>
    <xmp_type name="ordPoint">
      <xmp_field name="x" type="real" namespace="http://example.com/ordpt/" prefix="ordpt"/>
    </xmp_type>
    <xmp_type name="ordLater" extends="integer"/>)"),
                                                        kSource, false);
  EXPECT_EQ(result.first.size(), 1u);
  EXPECT_EQ(result.second.size(), 2u);
  EXPECT_TRUE(NamespaceDefinition("http://example.com/order/"));
  EXPECT_TRUE(TypeIdDefinition("ordLater"));
  since.Expect(kDefinitionRegistrationError, kSource,
               {"Error registering definition: XMP property \"ord:bad\" has an invalid type \"ordNothing\"."});
}

TEST_F(ParseAndRegister, DuplicatesEmptyTheReturnedListsButKeepWhatRegistered) {
  ASSERT_TRUE(RegisterTypeDefinition(boost::make_shared<TypeDefinition>(
                                         [] { TypeDefinition t; t.name = "dupTaken"; return t; }()),
                                     kSource));
  ErrorsSince since;
  const auto result = ParseBufferAndRegisterDefinitions(Document(R"(
    <xmp_type name="dupNew"/>
    <xmp_type name="dupTaken"/>
    <xmp_type name="dupAlso" extends="bag" element_type="nothingAtAll"/>
    <xmp_schema namespace="http://example.com/dup/" prefix="dup"/>)"),
                                                        kSource, false);
  EXPECT_TRUE(result.second.empty());
  EXPECT_TRUE(TypeIdDefinition("dupNew"));
  EXPECT_TRUE(TypeIdDefinition("dupAlso"));
  ASSERT_EQ(result.first.size(), 1u);
  // The field check is skipped when the types did not all register.
  since.Expect(kDefinitionRegistrationError, kSource,
               {"Error registering definition: type definition for \"dupTaken\" already exists."});

  ErrorsSince again;
  const auto repeated = ParseBufferAndRegisterDefinitions(
      Document(R"(<xmp_schema namespace="http://example.com/dup/" prefix="dup">
                    <xmp_property name="p" type="text"/></xmp_schema>)"),
      u"/defs/merge.xml", true);
  EXPECT_TRUE(repeated.first.empty());
  EXPECT_EQ(NamespaceDefinition("http://example.com/dup/")->properties.size(), 1u);
  EXPECT_TRUE(again.New().empty());
}

}  // namespace
