// Typed value access on real packets: every storage form read and written,
// validation reports, compare-before-write, verify-after-write,
// multi-valued properties, null packets and constructed values.
#include <ovrametadata/Values.h>
#include <ovraxmp/XMPToolkit.h>

#include "MetadataTestSupport.h"
#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

const char kNS[] = "http://ns.ovra.test/values/1.0/";

const char kDefinitions[] = R"(<xmp_definitions>
  <xmp_schema namespace="http://ns.ovra.test/values/1.0/" prefix="vt" label="Values test">
    <xmp_property name="Title" type="text"/>
    <xmp_property name="Count" type="integer"/>
    <xmp_property name="Flag" type="boolean"/>
    <xmp_property name="Mode" type="closedchoice" element_type="text">
      <xmp_choice raw_value="auto"/>
      <xmp_choice raw_value="manual"/>
    </xmp_property>
    <xmp_property name="Keywords" type="bag" element_type="text"/>
    <xmp_property name="Steps" type="seq" element_type="text"/>
    <xmp_property name="Caption" type="alt" element_type="text"/>
    <xmp_property name="When" type="date"/>
    <xmp_property name="Ratio" type="real"/>
    <xmp_property name="Stars" type="closedchoice" element_type="real">
      <xmp_choice raw_value="-1"/>
      <xmp_choice raw_value="5"/>
    </xmp_property>
    <xmp_property name="Exposure" type="rational" category="internal"/>
    <xmp_property name="Hidden" type="text" category="internal"/>
    <xmp_property name="Built" type="text" category="internal"/>
  </xmp_schema>
</xmp_definitions>)";

const char kPacket[] = R"(<x:xmpmeta xmlns:x="adobe:ns:meta/">
 <rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">
  <rdf:Description rdf:about="" xmlns:vt="http://ns.ovra.test/values/1.0/"
     vt:Title="Hello" vt:Count="42" vt:Flag="True" vt:Mode="auto"
     vt:When="2024-03-05T10:20:30+02:00" vt:Ratio="2.5" vt:Exposure="1/4">
   <vt:Keywords><rdf:Bag><rdf:li>alpha</rdf:li><rdf:li>beta; gamma</rdf:li></rdf:Bag></vt:Keywords>
   <vt:Steps><rdf:Seq><rdf:li>a</rdf:li><rdf:li>b</rdf:li></rdf:Seq></vt:Steps>
   <vt:Caption><rdf:Alt>
     <rdf:li xml:lang="x-default">Default caption</rdf:li>
     <rdf:li xml:lang="fr">Légende</rdf:li>
   </rdf:Alt></vt:Caption>
  </rdf:Description>
 </rdf:RDF>
</x:xmpmeta>)";

class ValuesTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() { ovratest::InitializeWithDefinitions(kDefinitions, kNS); }
  static void TearDownTestSuite() { Terminate(); }
  void SetUp() override { mMeta.ParseFromBuffer(kPacket); }

  XMPMetaRef Packet() const { return mMeta.GetInternalRef(); }
  static Path P(const char* name) { return ovratest::PathOf(kNS, name); }
  // The text read of a property, "<untouched>" when nothing was delivered.
  static UTF8String Read(XMPMetaRef xmp, const Path& path, GetValueResult* result = nullptr) {
    UTF8String text = "<untouched>";
    GetValue(xmp, path, text, result);
    return text;
  }
  UTF8String Read(const char* name, GetValueResult* result = nullptr) const { return Read(Packet(), P(name), result); }
  void ExpectReports(const char* kind, const std::vector<const char*>& properties) const {
    std::vector<std::string> texts;
    for (const char* property : properties)
      texts.push_back(std::string("Error ") + kind + " XMP data: invalid data in \"" + kNS + property + "\".");
    EXPECT_EQ(mErrors.Texts(), texts);
  }

  ovraxmp::XMPMeta mMeta;
  ovratest::ErrorsSince mErrors;
};

TEST_F(ValuesTest, EachStorageFormReadsAsText) {
  GetValueResult result = ValueError;
  EXPECT_EQ(Read("Title", &result), "Hello");
  EXPECT_EQ(result, ValueFound);
  EXPECT_EQ(Read("Steps"), "a; b");
  // An item holding the separator comes back quoted.
  EXPECT_EQ(Read("Keywords"), "alpha; \"beta; gamma\"");
  EXPECT_EQ(Read("Caption"), "Default caption");
  EXPECT_EQ(Read("When"), "2024-03-05T10:20:30+02:00");
  ExpectReports("reading", {});
}

TEST_F(ValuesTest, TypedReadsUseTheToolkitConversionsAndReportWhatDoesNotConvert) {
  bool flag = false;
  int count = 0;
  long long bigCount = 0;
  double ratio = 0;
  GetValueResult result = ValueError;
  EXPECT_TRUE(GetValue(Packet(), P("Flag"), flag, &result));
  EXPECT_TRUE(flag);
  EXPECT_EQ(result, ValueFound);
  EXPECT_TRUE(GetValue(Packet(), P("Count"), count));
  EXPECT_EQ(count, 42);
  EXPECT_TRUE(GetValue(Packet(), P("Count"), bigCount));
  EXPECT_EQ(bigCount, 42);
  EXPECT_TRUE(GetValue(Packet(), P("Ratio"), ratio));
  EXPECT_DOUBLE_EQ(ratio, 2.5);

  count = 7;
  EXPECT_FALSE(GetValue(Packet(), P("Title"), count, &result));  // "Hello"
  EXPECT_EQ(count, 7);
  EXPECT_EQ(result, ValueError);
  ExpectReports("reading", {"Title"});
}

TEST_F(ValuesTest, DatesReadInUTCOnlyForDateProperties) {
  Date date;
  GetValueResult result = ValueError;
  ASSERT_TRUE(GetValue(Packet(), P("When"), date, &result));
  EXPECT_EQ(result, ValueFound);
  EXPECT_EQ(date, (Date{2024, 3, 5, 8, 20, 30}));

  Date untouched;
  untouched.year = 1999;
  EXPECT_FALSE(GetValue(Packet(), P("Title"), untouched, &result));
  EXPECT_EQ(untouched.year, 1999);
  EXPECT_FALSE(GetValue(Packet(), Path(), untouched, &result));
  EXPECT_EQ(result, ValueError);
}

TEST_F(ValuesTest, AbsentPropertyIsReportedAsAbsent) {
  for (const char* name : {"Title", "Keywords", "Flag"}) mMeta.DeleteProperty(kNS, name);
  GetValueResult result = ValueFound;
  EXPECT_EQ(Read("Title", &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  // Catenating a missing array would give an empty text: it is absent too.
  result = ValueFound;
  EXPECT_EQ(Read("Keywords", &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  bool flag = false;
  result = ValueFound;
  EXPECT_FALSE(GetValue(Packet(), P("Flag"), flag, &result));
  EXPECT_EQ(result, ValueAbsent);
}

TEST_F(ValuesTest, RawStringNeedsNoDefinitionAndIsNotFormatted) {
  Path undefined;
  undefined.namespaceURI = kNS;
  undefined.description = "Exposure";
  UTF8String raw;
  GetValueResult result = ValueError;
  EXPECT_TRUE(GetRawStringValue(Packet(), undefined, raw, &result));
  EXPECT_EQ(raw, "1/4");
  EXPECT_EQ(result, ValueFound);
  raw.clear();
  EXPECT_TRUE(GetRawStringValue(Packet(), P("Exposure"), raw));
  EXPECT_EQ(raw, "1/4");
}

TEST_F(ValuesTest, TextNotFittingItsTypeIsDeliveredAndReported) {
  const struct {
    const char* property;
    const char* stored;
    bool valid;
  } rows[] = {
      {"Flag", "tRuE", true},   {"Flag", "0", true},      {"Flag", "yes", false}, {"Count", "42", true},
      {"Count", "007", false},  {"Count", "+7", false},   {"Mode", "manual", true}, {"Mode", "Manual", false},
      {"Stars", "5.0", true},   {"Stars", "-1", true},    {"Stars", "4.5", false},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(std::string(row.property) + "=" + row.stored);
    const ovratest::ErrorsSince since;
    mMeta.SetProperty(kNS, row.property, row.stored);
    GetValueResult result = ValueError;
    EXPECT_EQ(Read(row.property, &result), row.stored);
    EXPECT_EQ(result, ValueFound);
    std::vector<std::string> expected;
    if (!row.valid)
      expected.push_back(std::string("Error reading XMP data: invalid data in \"") + kNS + row.property + "\".");
    EXPECT_EQ(since.Texts(), expected);
  }
}

TEST_F(ValuesTest, InternalPropertiesAreFormattedUnlessForcedWritable) {
  EXPECT_EQ(Read("Exposure"), "0.25");
  ForcedAllMetadataWritable(true);
  EXPECT_EQ(Read("Exposure"), "1/4");
  ForcedAllMetadataWritable(false);
  // Without a formatter the raw text is shown.
  mMeta.SetProperty(kNS, "Hidden", "as stored");
  EXPECT_EQ(Read("Hidden"), "as stored");
}

TEST_F(ValuesTest, MissingInternalPropertyFallsBackToItsFallbackPath) {
  AddFallbackPath(P("Hidden"), P("Title"));
  mMeta.DeleteProperty(kNS, "Hidden");
  GetValueResult result = ValueError;
  EXPECT_EQ(Read("Hidden", &result), "Hello");
  EXPECT_EQ(result, ValueFound);

  // An ordinary property gets no constructed value.
  Path ordinary = P("Hidden");
  ordinary.internal = false;
  EXPECT_EQ(Read(Packet(), ordinary, &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  // Nor does an internal one whose fallback is missing too.
  mMeta.DeleteProperty(kNS, "Title");
  result = ValueError;
  EXPECT_EQ(Read("Hidden", &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
}

TEST_F(ValuesTest, MissingInternalPropertyIsBuiltByItsAggregator) {
  AddValueAggregator(P("Built"), [](XMPMetaRef xmp, const Path&, UTF8String& out, GetValueResult* result) {
    UTF8String title, count;
    if (!GetValue(xmp, PathForSchemaNameAndPropertyName(kNS, "Title"), title) ||
        !GetValue(xmp, PathForSchemaNameAndPropertyName(kNS, "Count"), count))
      return false;
    out = title + " x" + count;
    if (result) *result = ValueFound;
    return true;
  });
  GetValueResult result = ValueError;
  EXPECT_EQ(Read("Built", &result), "Hello x42");
  EXPECT_EQ(result, ValueFound);
  // A stored value wins over the constructed one.
  mMeta.SetProperty(kNS, "Built", "stored");
  EXPECT_EQ(Read("Built"), "stored");
  // An aggregator without function fails inside the library, not in the caller.
  mMeta.DeleteProperty(kNS, "Built");
  AddValueAggregator(P("Built"), ValueAggregatorFn());
  EXPECT_EQ(Read("Built", &result), "<untouched>");
  EXPECT_EQ(result, ValueError);
  ExpectReports("reading", {"Built"});
}

TEST_F(ValuesTest, MultiValuedPropertyReadsAsMixedAndIsAlwaysWritten) {
  mMeta.SetMultiValued(kNS, "Title");
  mMeta.SetMultiValued(kNS, "Count");
  GetValueResult result = ValueFound;
  EXPECT_EQ(Read("Title", &result), "<untouched>");
  EXPECT_EQ(result, ValueMixed);
  UTF8String raw;
  result = ValueFound;
  EXPECT_FALSE(GetRawStringValue(Packet(), P("Title"), raw, &result));
  EXPECT_EQ(result, ValueMixed);
  int count = 0;
  result = ValueFound;
  EXPECT_FALSE(GetValue(Packet(), P("Count"), count, &result));
  EXPECT_EQ(result, ValueMixed);
  EXPECT_EQ(count, 0);

  // Writing the same value clears the mark.
  EXPECT_TRUE(SetValue(Packet(), P("Title"), UTF8String("Hello")));
  EXPECT_FALSE(mMeta.IsMultiValued(kNS, "Title"));
  EXPECT_TRUE(SetValue(Packet(), P("Count"), 42));
  EXPECT_FALSE(mMeta.IsMultiValued(kNS, "Count"));
  EXPECT_EQ(Read("Title"), "Hello");
}

TEST_F(ValuesTest, EachFormIsWrittenInItsStorageForm) {
  const auto item = [&](const char* array, int index) { return mMeta.GetArrayItem(kNS, array, index)->value; };
  EXPECT_TRUE(SetValue(Packet(), P("Keywords"), "one; two"));
  ASSERT_EQ(mMeta.CountArrayItems(kNS, "Keywords"), 2);
  EXPECT_EQ(item("Keywords", 2), "two");
  // Stored as two items and read back as "three; four": only spaces differ,
  // so the verification after the write reports nothing.
  EXPECT_TRUE(SetValue(Packet(), P("Keywords"), "three;four"));
  EXPECT_EQ(mMeta.CountArrayItems(kNS, "Keywords"), 2);

  mMeta.DeleteProperty(kNS, "Steps");
  EXPECT_TRUE(SetValue(Packet(), P("Steps"), "first; \"se;cond\""));
  EXPECT_TRUE(mMeta.GetProperty(kNS, "Steps")->options & ovraxmp::kXMP_PropArrayIsOrdered);
  EXPECT_EQ(item("Steps", 2), "se;cond");

  EXPECT_TRUE(SetValue(Packet(), P("Caption"), "New caption"));
  EXPECT_EQ(mMeta.GetLocalizedText(kNS, "Caption", "", "x-default")->value, "New caption");
  EXPECT_TRUE(SetValue(Packet(), P("Title"), "Bye"));
  EXPECT_EQ(mMeta.GetProperty(kNS, "Title")->value, "Bye");
  EXPECT_TRUE(SetValue(Packet(), P("When"), "2025-01-02T03:04:05Z"));
  Date date;
  ASSERT_TRUE(GetValue(Packet(), P("When"), date));
  EXPECT_EQ(date, (Date{2025, 1, 2, 3, 4, 5}));
  ExpectReports("writing", {});
}

TEST_F(ValuesTest, EqualValuesAreNotWritten) {
  EXPECT_FALSE(SetValue(Packet(), P("Title"), "Hello"));
  EXPECT_FALSE(SetValue(Packet(), P("Steps"), "a; b"));
  EXPECT_FALSE(SetValue(Packet(), P("Caption"), "Default caption"));
  EXPECT_FALSE(SetValue(Packet(), P("Count"), 42));
  EXPECT_FALSE(SetValue(Packet(), P("Count"), 42LL));
  EXPECT_FALSE(SetValue(Packet(), P("Flag"), true));
  EXPECT_FALSE(SetValue(Packet(), P("Ratio"), 2.5));
  EXPECT_TRUE(SetValue(Packet(), P("Keywords"), "x; y"));
  EXPECT_FALSE(SetValue(Packet(), P("Keywords"), "x; y"));
  // Nothing stored and nothing to store.
  mMeta.DeleteProperty(kNS, "Title");
  EXPECT_FALSE(SetValue(Packet(), P("Title"), ""));
  EXPECT_FALSE(mMeta.DoesPropertyExist(kNS, "Title"));
}

TEST_F(ValuesTest, TypedWritesReplaceUnreadableValues) {
  mMeta.SetProperty(kNS, "Count", "many");
  EXPECT_TRUE(SetValue(Packet(), P("Count"), 3));
  int count = 0;
  EXPECT_TRUE(GetValue(Packet(), P("Count"), count));
  EXPECT_EQ(count, 3);
  EXPECT_TRUE(SetValue(Packet(), P("Flag"), false));
  EXPECT_TRUE(SetValue(Packet(), P("Ratio"), 0.5));
  EXPECT_TRUE(SetValue(Packet(), P("Count"), 1LL << 40));
  long long big = 0;
  EXPECT_TRUE(GetValue(Packet(), P("Count"), big));
  EXPECT_EQ(big, 1LL << 40);
  ExpectReports("writing", {});
}

TEST_F(ValuesTest, ReadBackThatDiffersIsReportedButCounts) {
  // The toolkit drops empty items, so the stored text reads back shorter.
  EXPECT_TRUE(SetValue(Packet(), P("Keywords"), "x;;y"));
  ExpectReports("writing", {"Keywords"});
}

TEST_F(ValuesTest, TextThatIsNoDateIsReportedAndNotWritten) {
  EXPECT_FALSE(SetValue(Packet(), P("When"), "next tuesday"));
  ExpectReports("writing", {"When"});
  EXPECT_EQ(Read("When"), "2024-03-05T10:20:30+02:00");
}

TEST_F(ValuesTest, NullPacketOrMissingDefinitionReadsAndWritesNothing) {
  GetValueResult result = ValueFound;
  EXPECT_EQ(Read(nullptr, P("Title"), &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  bool flag = false;
  result = ValueFound;
  EXPECT_FALSE(GetValue(nullptr, P("Flag"), flag, &result));
  EXPECT_EQ(result, ValueAbsent);
  Date date;
  result = ValueFound;
  EXPECT_FALSE(GetValue(nullptr, P("When"), date, &result));
  EXPECT_EQ(result, ValueAbsent);
  // The definition is tested before the packet.
  EXPECT_EQ(Read(nullptr, Path(), &result), "<untouched>");
  EXPECT_EQ(result, ValueError);
  EXPECT_FALSE(SetValue(nullptr, P("Title"), "x"));
  EXPECT_FALSE(SetValue(nullptr, P("Count"), 1));
  EXPECT_FALSE(SetValue(nullptr, P("When"), "2024"));
  ExpectReports("writing", {});

  // Text needs a definition; typed writers do not consult one.
  Path undefined;
  undefined.namespaceURI = kNS;
  undefined.description = "Title";
  EXPECT_FALSE(SetValue(Packet(), undefined, "changed"));
  EXPECT_TRUE(SetValue(Packet(), undefined, 5));
}

TEST_F(ValuesTest, OneLanguageOfAnAlternativeIsReadAndWrittenAlone) {
  EXPECT_EQ(GetAltTextLanguages(Packet(), P("Caption")), (std::vector<UTF8String>{"x-default", "fr"}));
  UTF8String text;
  ASSERT_TRUE(GetAltTextValue(Packet(), P("Caption"), "FR", text));
  EXPECT_EQ(text, "Légende");
  EXPECT_FALSE(GetAltTextValue(Packet(), P("Caption"), "de", text));  // no fallback to x-default

  EXPECT_TRUE(SetAltTextValue(Packet(), P("Caption"), "de-CH", "Legende"));
  EXPECT_TRUE(SetAltTextValue(Packet(), P("Caption"), "fr", "Titre"));
  EXPECT_FALSE(SetAltTextValue(Packet(), P("Caption"), "fr", "Titre"));  // unchanged
  EXPECT_EQ(GetAltTextLanguages(Packet(), P("Caption")), (std::vector<UTF8String>{"x-default", "fr", "de-CH"}));
  ASSERT_TRUE(GetAltTextValue(Packet(), P("Caption"), "x-default", text));
  EXPECT_EQ(text, "Default caption");
  // A new alternative starts with its default item.
  mMeta.DeleteProperty(kNS, "Caption");
  EXPECT_TRUE(SetAltTextValue(Packet(), P("Caption"), "it", "Didascalia"));
  EXPECT_EQ(GetAltTextLanguages(Packet(), P("Caption")), (std::vector<UTF8String>{"x-default", "it"}));
  ExpectReports("writing", {});

  EXPECT_FALSE(SetAltTextValue(Packet(), P("Caption"), "not a tag", "x"));
  EXPECT_FALSE(SetAltTextValue(Packet(), P("Title"), "fr", "x"));
  ExpectReports("writing", {"Caption", "Title"});
}

TEST_F(ValuesTest, WhatAPacketStoresIsListedWithoutDefinitions) {
  mMeta.ParseFromBuffer(R"(<x:xmpmeta xmlns:x="adobe:ns:meta/"><rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">
    <rdf:Description rdf:about="" xmlns:un="http://ns.ovra.test/undefined/" un:Simple="s">
     <un:Area rdf:parseType="Resource"><un:x>0.5</un:x></un:Area>
     <un:List><rdf:Seq><rdf:li>a</rdf:li><rdf:li>b</rdf:li></rdf:Seq></un:List>
     <un:Caption><rdf:Alt><rdf:li xml:lang="x-default">Hi</rdf:li><rdf:li xml:lang="fr">Salut</rdf:li></rdf:Alt></un:Caption>
    </rdf:Description></rdf:RDF></x:xmpmeta>)");
  const auto namespaces = GetStoredNamespaces(Packet());
  ASSERT_EQ(namespaces.size(), 1u);
  EXPECT_EQ(namespaces[0].prefix, "un");
  const auto nodes = GetStoredNodes(Packet(), namespaces[0].namespaceURI);
  ASSERT_EQ(nodes.size(), 4u);
  EXPECT_EQ(nodes[0].name, "un:Simple");
  EXPECT_EQ(nodes[0].value, "s");
  EXPECT_EQ(nodes[1].kind, StoredNode::kStruct);
  ASSERT_EQ(nodes[1].children.size(), 1u);
  EXPECT_EQ(nodes[1].children[0].name, "un:x");
  EXPECT_EQ(nodes[1].children[0].value, "0.5");
  EXPECT_EQ(nodes[2].kind, StoredNode::kArray);
  ASSERT_EQ(nodes[2].children.size(), 2u);
  EXPECT_EQ(nodes[2].children[1].name, "[2]");
  EXPECT_EQ(nodes[2].children[1].value, "b");
  ASSERT_EQ(nodes[3].children.size(), 2u);
  EXPECT_EQ(nodes[3].children[1].language, "fr");
  EXPECT_EQ(nodes[3].children[1].value, "Salut");
  EXPECT_TRUE(GetStoredNodes(nullptr, namespaces[0].namespaceURI).empty());
}

}  // namespace
}  // namespace ovrametadata
