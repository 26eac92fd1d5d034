// Typed value access on real packets: every storage form read and written,
// validation reports, compare-before-write, verify-after-write,
// multi-valued properties, null packets and constructed values.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <ovracore/Strings.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Values.h>
#include <ovraxmp/XMPToolkit.h>

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
  static void SetUpTestSuite() {
    Initialize();
    if (!NamespaceDefinition(kNS)) {
      ParseBufferAndRegisterDefinitions(kDefinitions, u"values-test", false);
    }
  }
  static void TearDownTestSuite() { Terminate(); }

  void SetUp() override {
    ASSERT_TRUE(NamespaceDefinition(kNS));
    mMeta.ParseFromBuffer(kPacket);
    mErrorsBefore = GetErrorInfos().size();
  }

  XMPMetaRef Packet() const { return mMeta.GetInternalRef(); }
  static Path PathOf(const char* name) {
    Path path = PathForSchemaNameAndPropertyName(kNS, name);
    EXPECT_FALSE(path.description.empty()) << name;
    return path;
  }

  // The messages reported since SetUp.
  std::vector<UTF8String> NewErrors() const {
    std::vector<UTF8String> texts;
    const auto errors = GetErrorInfos();
    for (auto i = mErrorsBefore; i < errors.size(); ++i) {
      texts.push_back(ovracore::ToUTF8(errors[i].message));
    }
    return texts;
  }
  static UTF8String ReadError(const char* property) {
    return UTF8String("Error reading XMP data: invalid data in \"") + kNS + property + "\".";
  }
  static UTF8String WriteError(const char* property) {
    return UTF8String("Error writing XMP data: invalid data in \"") + kNS + property + "\".";
  }

  ovraxmp::XMPMeta mMeta;
  std::size_t mErrorsBefore = 0;
};

UTF8String ReadText(XMPMetaRef xmp, const Path& path, GetValueResult* result = nullptr) {
  UTF8String text = "<untouched>";
  GetValue(xmp, path, text, result);
  return text;
}

// ---- Reading each storage form ----

TEST_F(ValuesTest, EachStorageFormReadsAsText) {
  GetValueResult result = ValueError;
  EXPECT_EQ(ReadText(Packet(), PathOf("Title"), &result), "Hello");
  EXPECT_EQ(result, ValueFound);
  EXPECT_EQ(ReadText(Packet(), PathOf("Steps")), "a; b");
  // An item holding the separator comes back quoted.
  EXPECT_EQ(ReadText(Packet(), PathOf("Keywords")), "alpha; \"beta; gamma\"");
  EXPECT_EQ(ReadText(Packet(), PathOf("Caption")), "Default caption");
  EXPECT_EQ(ReadText(Packet(), PathOf("When")), "2024-03-05T10:20:30+02:00");
  EXPECT_TRUE(NewErrors().empty());
}

TEST_F(ValuesTest, TypedReadsUseTheToolkitConversionsAndReportWhatDoesNotConvert) {
  bool flag = false;
  int count = 0;
  long long bigCount = 0;
  double ratio = 0;
  GetValueResult result = ValueError;
  EXPECT_TRUE(GetValue(Packet(), PathOf("Flag"), flag, &result));
  EXPECT_TRUE(flag);
  EXPECT_EQ(result, ValueFound);
  EXPECT_TRUE(GetValue(Packet(), PathOf("Count"), count));
  EXPECT_EQ(count, 42);
  EXPECT_TRUE(GetValue(Packet(), PathOf("Count"), bigCount));
  EXPECT_EQ(bigCount, 42);
  EXPECT_TRUE(GetValue(Packet(), PathOf("Ratio"), ratio));
  EXPECT_DOUBLE_EQ(ratio, 2.5);
  EXPECT_TRUE(NewErrors().empty());

  count = 7;
  EXPECT_FALSE(GetValue(Packet(), PathOf("Title"), count, &result));  // "Hello"
  EXPECT_EQ(count, 7);
  EXPECT_EQ(result, ValueError);
  EXPECT_EQ(NewErrors(), std::vector<UTF8String>{ReadError("Title")});
}

TEST_F(ValuesTest, DatesReadInUTCOnlyForDateProperties) {
  Date date;
  GetValueResult result = ValueError;
  ASSERT_TRUE(GetValue(Packet(), PathOf("When"), date, &result));
  EXPECT_EQ(result, ValueFound);
  EXPECT_EQ(date, (Date{2024, 3, 5, 8, 20, 30}));

  Date untouched;
  untouched.year = 1999;
  EXPECT_FALSE(GetValue(Packet(), PathOf("Title"), untouched, &result));
  EXPECT_EQ(untouched.year, 1999);
  EXPECT_FALSE(GetValue(Packet(), Path(), untouched, &result));
  EXPECT_EQ(result, ValueError);
}

TEST_F(ValuesTest, AbsentPropertyIsReportedAsAbsent) {
  mMeta.DeleteProperty(kNS, "Title");
  GetValueResult result = ValueFound;
  EXPECT_EQ(ReadText(Packet(), PathOf("Title"), &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  // Catenating a missing array would give an empty text: it is absent too.
  mMeta.DeleteProperty(kNS, "Keywords");
  EXPECT_EQ(ReadText(Packet(), PathOf("Keywords"), &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  bool flag = false;
  mMeta.DeleteProperty(kNS, "Flag");
  EXPECT_FALSE(GetValue(Packet(), PathOf("Flag"), flag, &result));
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
  EXPECT_TRUE(GetRawStringValue(Packet(), PathOf("Exposure"), raw));
  EXPECT_EQ(raw, "1/4");
}

// ---- Validation ----

TEST_F(ValuesTest, TextNotFittingItsTypeIsDeliveredAndReported) {
  struct Row {
    const char* property;
    const char* stored;
    bool valid;
  };
  const Row rows[] = {
      {"Flag", "tRuE", true},  {"Flag", "0", true},     {"Flag", "yes", false},
      {"Count", "42", true},   {"Count", "007", false}, {"Count", "+7", false},
      {"Mode", "manual", true}, {"Mode", "Manual", false},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(std::string(row.property) + "=" + row.stored);
    const auto before = NewErrors().size();
    mMeta.SetProperty(kNS, row.property, row.stored);
    GetValueResult result = ValueError;
    EXPECT_EQ(ReadText(Packet(), PathOf(row.property), &result), row.stored);
    EXPECT_EQ(result, ValueFound);
    const auto errors = NewErrors();
    if (row.valid) {
      EXPECT_EQ(errors.size(), before);
    } else {
      ASSERT_EQ(errors.size(), before + 1);
      EXPECT_EQ(errors.back(), ReadError(row.property));
    }
  }
}

// ---- Internal properties ----

TEST_F(ValuesTest, InternalPropertiesAreFormattedUnlessForcedWritable) {
  EXPECT_EQ(ReadText(Packet(), PathOf("Exposure")), "0.25");
  ForcedAllMetadataWritable(true);
  EXPECT_EQ(ReadText(Packet(), PathOf("Exposure")), "1/4");
  ForcedAllMetadataWritable(false);
  // Without a formatter the raw text is shown.
  mMeta.SetProperty(kNS, "Hidden", "as stored");
  EXPECT_EQ(ReadText(Packet(), PathOf("Hidden")), "as stored");
}

TEST_F(ValuesTest, MissingInternalPropertyFallsBackToItsFallbackPath) {
  AddFallbackPath(PathOf("Hidden"), PathOf("Title"));
  mMeta.DeleteProperty(kNS, "Hidden");
  GetValueResult result = ValueError;
  EXPECT_EQ(ReadText(Packet(), PathOf("Hidden"), &result), "Hello");
  EXPECT_EQ(result, ValueFound);

  // An ordinary property gets no constructed value.
  Path ordinary = PathOf("Hidden");
  ordinary.internal = false;
  EXPECT_EQ(ReadText(Packet(), ordinary, &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  // Nor does an internal one whose fallback is missing too.
  mMeta.DeleteProperty(kNS, "Title");
  EXPECT_EQ(ReadText(Packet(), PathOf("Hidden"), &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
}

TEST_F(ValuesTest, MissingInternalPropertyIsBuiltByItsAggregator) {
  AddValueAggregator(PathOf("Built"),
                     [](XMPMetaRef xmp, const Path&, UTF8String& out, GetValueResult* result) {
                       UTF8String title, count;
                       if (!GetValue(xmp, PathForSchemaNameAndPropertyName(kNS, "Title"), title) ||
                           !GetValue(xmp, PathForSchemaNameAndPropertyName(kNS, "Count"), count)) {
                         return false;
                       }
                       out = title + " x" + count;
                       if (result) *result = ValueFound;
                       return true;
                     });
  GetValueResult result = ValueError;
  EXPECT_EQ(ReadText(Packet(), PathOf("Built"), &result), "Hello x42");
  EXPECT_EQ(result, ValueFound);
  // A stored value wins over the constructed one.
  mMeta.SetProperty(kNS, "Built", "stored");
  EXPECT_EQ(ReadText(Packet(), PathOf("Built")), "stored");
  // An aggregator without function fails inside the library, not in the caller.
  mMeta.DeleteProperty(kNS, "Built");
  AddValueAggregator(PathOf("Built"), ValueAggregatorFn());
  EXPECT_EQ(ReadText(Packet(), PathOf("Built"), &result), "<untouched>");
  EXPECT_EQ(result, ValueError);
  EXPECT_EQ(NewErrors(), std::vector<UTF8String>{ReadError("Built")});
}

// ---- Multi-valued properties ----

TEST_F(ValuesTest, MultiValuedPropertyReadsAsMixedEverywhere) {
  mMeta.SetMultiValued(kNS, "Title");
  mMeta.SetMultiValued(kNS, "Count");
  GetValueResult result = ValueFound;
  EXPECT_EQ(ReadText(Packet(), PathOf("Title"), &result), "<untouched>");
  EXPECT_EQ(result, ValueMixed);
  UTF8String raw;
  EXPECT_FALSE(GetRawStringValue(Packet(), PathOf("Title"), raw, &result));
  EXPECT_EQ(result, ValueMixed);
  int count = 0;
  EXPECT_FALSE(GetValue(Packet(), PathOf("Count"), count, &result));
  EXPECT_EQ(result, ValueMixed);
  EXPECT_EQ(count, 0);
}

TEST_F(ValuesTest, WritingAMultiValuedPropertyAlwaysWritesAndClearsTheMark) {
  mMeta.SetMultiValued(kNS, "Title");
  mMeta.SetMultiValued(kNS, "Count");
  EXPECT_TRUE(SetValue(Packet(), PathOf("Title"), UTF8String("Hello")));  // same text
  EXPECT_FALSE(mMeta.IsMultiValued(kNS, "Title"));
  EXPECT_TRUE(SetValue(Packet(), PathOf("Count"), 42));
  EXPECT_FALSE(mMeta.IsMultiValued(kNS, "Count"));
  EXPECT_EQ(ReadText(Packet(), PathOf("Title")), "Hello");
}

// ---- Writing ----

TEST_F(ValuesTest, ArraysAreWrittenItemByItemInTheirForm) {
  EXPECT_TRUE(SetValue(Packet(), PathOf("Keywords"), "one; two"));
  ASSERT_EQ(mMeta.CountArrayItems(kNS, "Keywords"), 2);
  std::string item;
  ovraxmp::XMP_OptionBits options = 0;
  mMeta.GetArrayItem(kNS, "Keywords", 2, &item);
  EXPECT_EQ(item, "two");

  mMeta.DeleteProperty(kNS, "Steps");
  EXPECT_TRUE(SetValue(Packet(), PathOf("Steps"), "first; \"se;cond\""));
  mMeta.GetProperty(kNS, "Steps", &item, &options);
  EXPECT_TRUE(options & ovraxmp::kXMP_PropArrayIsOrdered);
  mMeta.GetArrayItem(kNS, "Steps", 2, &item);
  EXPECT_EQ(item, "se;cond");
  EXPECT_TRUE(NewErrors().empty());
}

TEST_F(ValuesTest, ReSpacedArrayTextIsNotADifference) {
  // Stored as two items and read back as "one; two": only spaces differ.
  EXPECT_TRUE(SetValue(Packet(), PathOf("Keywords"), "one;two"));
  EXPECT_EQ(mMeta.CountArrayItems(kNS, "Keywords"), 2);
  EXPECT_TRUE(NewErrors().empty());
}

TEST_F(ValuesTest, AltAndSimpleAndDateForms) {
  EXPECT_TRUE(SetValue(Packet(), PathOf("Caption"), "New caption"));
  std::string language, text;
  ASSERT_TRUE(mMeta.GetLocalizedText(kNS, "Caption", "", "x-default", &language, &text));
  EXPECT_EQ(text, "New caption");

  EXPECT_TRUE(SetValue(Packet(), PathOf("Title"), "Bye"));
  mMeta.GetProperty(kNS, "Title", &text);
  EXPECT_EQ(text, "Bye");

  EXPECT_TRUE(SetValue(Packet(), PathOf("When"), "2025-01-02T03:04:05Z"));
  Date date;
  ASSERT_TRUE(GetValue(Packet(), PathOf("When"), date));
  EXPECT_EQ(date.year, 2025);
  EXPECT_EQ(date.hour, 3);
  EXPECT_TRUE(NewErrors().empty());
}

TEST_F(ValuesTest, EqualValuesAreNotWritten) {
  EXPECT_FALSE(SetValue(Packet(), PathOf("Title"), "Hello"));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Steps"), "a; b"));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Caption"), "Default caption"));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Count"), 42));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Count"), 42LL));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Flag"), true));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Ratio"), 2.5));
  // Writing the same array text twice writes once.
  EXPECT_TRUE(SetValue(Packet(), PathOf("Keywords"), "x; y"));
  EXPECT_FALSE(SetValue(Packet(), PathOf("Keywords"), "x; y"));
  // Nothing stored and nothing to store.
  mMeta.DeleteProperty(kNS, "Title");
  EXPECT_FALSE(SetValue(Packet(), PathOf("Title"), ""));
  EXPECT_FALSE(mMeta.DoesPropertyExist(kNS, "Title"));
}

TEST_F(ValuesTest, TypedWritesReplaceUnreadableValues) {
  mMeta.SetProperty(kNS, "Count", "many");
  EXPECT_TRUE(SetValue(Packet(), PathOf("Count"), 3));
  int count = 0;
  EXPECT_TRUE(GetValue(Packet(), PathOf("Count"), count));
  EXPECT_EQ(count, 3);
  EXPECT_TRUE(SetValue(Packet(), PathOf("Flag"), false));
  EXPECT_TRUE(SetValue(Packet(), PathOf("Ratio"), 0.5));
  EXPECT_TRUE(SetValue(Packet(), PathOf("Count"), 1LL << 40));
  long long big = 0;
  EXPECT_TRUE(GetValue(Packet(), PathOf("Count"), big));
  EXPECT_EQ(big, 1LL << 40);
  EXPECT_TRUE(NewErrors().empty());
}

TEST_F(ValuesTest, ReadBackThatDiffersIsReportedButCounts) {
  // The toolkit drops empty items, so the stored text reads back shorter.
  EXPECT_TRUE(SetValue(Packet(), PathOf("Keywords"), "x;;y"));
  EXPECT_EQ(NewErrors(), std::vector<UTF8String>{WriteError("Keywords")});
}

TEST_F(ValuesTest, TextThatIsNoDateIsReportedAndNotWritten) {
  EXPECT_FALSE(SetValue(Packet(), PathOf("When"), "next tuesday"));
  EXPECT_EQ(NewErrors(), std::vector<UTF8String>{WriteError("When")});
  EXPECT_EQ(ReadText(Packet(), PathOf("When")), "2024-03-05T10:20:30+02:00");
}

// ---- Null packets ----

TEST_F(ValuesTest, NullPacketOrMissingDefinitionReadsAndWritesNothing) {
  GetValueResult result = ValueFound;
  EXPECT_EQ(ReadText(nullptr, PathOf("Title"), &result), "<untouched>");
  EXPECT_EQ(result, ValueAbsent);
  bool flag = false;
  EXPECT_FALSE(GetValue(nullptr, PathOf("Flag"), flag, &result));
  EXPECT_EQ(result, ValueAbsent);
  Date date;
  EXPECT_FALSE(GetValue(nullptr, PathOf("When"), date, &result));
  EXPECT_EQ(result, ValueAbsent);
  // The definition is tested before the packet.
  EXPECT_EQ(ReadText(nullptr, Path(), &result), "<untouched>");
  EXPECT_EQ(result, ValueError);

  EXPECT_FALSE(SetValue(nullptr, PathOf("Title"), "x"));
  EXPECT_FALSE(SetValue(nullptr, PathOf("Count"), 1));
  EXPECT_FALSE(SetValue(nullptr, PathOf("When"), "2024"));
  EXPECT_TRUE(NewErrors().empty());

  // Text needs a definition; typed writers do not consult one.
  Path undefined;
  undefined.namespaceURI = kNS;
  undefined.description = "Title";
  EXPECT_FALSE(SetValue(Packet(), undefined, "changed"));
  EXPECT_TRUE(SetValue(Packet(), undefined, 5));
}

}  // namespace
}  // namespace ovrametadata
