// Presence, deletion and its records, array items, templates and the
// minimal float write.
#include <gtest/gtest.h>

#include <boost/make_shared.hpp>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/ValueEditing.h>
#include <ovrametadata/Values.h>

#include "ProviderTestSupport.h"

namespace {

using namespace ovrametadata;
using ovratest::RecordingBufferProvider;

const std::string kTransient = ovraxmp::kXMP_NS_Transient;

std::string Bag(const std::string& name, std::initializer_list<std::string> items,
                const std::string& kind = "Bag") {
  std::string out = "<pt:" + name + "><rdf:" + kind + ">";
  for (const std::string& item : items) out += "<rdf:li>" + item + "</rdf:li>";
  return out + "</rdf:" + kind + "></pt:" + name + ">";
}

std::vector<std::string> Items(const ovraxmp::XMPMeta& meta, const std::string& name) {
  std::vector<std::string> items;
  const int count = meta.DoesPropertyExist(ovratest::kTestNS, name)
                        ? meta.CountArrayItems(ovratest::kTestNS, name)
                        : 0;
  for (int i = 1; i <= count; ++i) {
    items.push_back(meta.GetArrayItem(ovratest::kTestNS, name, i).value_or(ovraxmp::XMP_Node()).value);
  }
  return items;
}

ovraxmp::XMP_OptionBits Options(const ovraxmp::XMPMeta& meta, const std::string& ns,
                                const std::string& path) {
  return meta.GetProperty(ns, path).value_or(ovraxmp::XMP_Node()).options;
}

// A packet marked as the aggregate of several files.
ovraxmp::XMPMeta AggregatePacket(const std::string& properties) {
  ovraxmp::XMPMeta meta = ovratest::Packet(properties);
  meta.SetProperty(kTransient, "MultiFileCount", "2");
  return meta;
}

// (DelURI, DelPath) of every deletion record, in order.
std::vector<std::pair<std::string, std::string>> DeletionRecords(const ovraxmp::XMPMeta& meta) {
  std::vector<std::pair<std::string, std::string>> records;
  if (!meta.DoesPropertyExist(kTransient, "DeletedProperties")) return records;
  const int count = meta.CountArrayItems(kTransient, "DeletedProperties");
  for (int i = 1; i <= count; ++i) {
    const std::string item = ovraxmp::XMPUtils::ComposeArrayItemPath(kTransient, "DeletedProperties", i);
    const auto field = [&](const char* name) {
      return meta.GetStructField(kTransient, item, kTransient, name).value_or(ovraxmp::XMP_Node()).value;
    };
    records.emplace_back(field("DelURI"), field("DelPath"));
  }
  return records;
}

// ---------------------------------------------------------------------------
// Presence and deletion

TEST(HasValue, AnswersForExistingAbsentAndNullPackets) {
  ovraxmp::XMPMeta meta = ovratest::Packet("<pt:Title>t</pt:Title>");
  EXPECT_TRUE(HasValue(meta.GetInternalRef(), ovratest::TestPath("Title")));
  EXPECT_FALSE(HasValue(meta.GetInternalRef(), ovratest::TestPath("Note")));
  EXPECT_FALSE(HasValue(nullptr, ovratest::TestPath("Title")));
}

TEST(DeleteValue, AnArrayItemIsEmptiedSoThatIndicesStay) {
  ovraxmp::XMPMeta meta = AggregatePacket(Bag("Tags", {"a", "b", "c"}));
  const Path second = CreatePathFromArrayItem(ovratest::TestPath("Tags"), 2);
  ASSERT_FALSE(second.description.empty());
  EXPECT_TRUE(DeleteValue(meta.GetInternalRef(), second));
  EXPECT_EQ(Items(meta, "Tags"), (std::vector<std::string>{"a", "", "c"}));
  // Emptying is not a deletion: nothing is recorded.
  EXPECT_TRUE(DeletionRecords(meta).empty());
  // An item that is already empty is not written again.
  EXPECT_FALSE(DeleteValue(meta.GetInternalRef(), second));
}

TEST(DeleteValue, StructuresLeftEmptyAreRemovedUpToTheFirstWithAValue) {
  const Path spot = ovratest::TestPath("Spot");
  const Path spotX = ovratest::FieldPath(spot, "PTPoint", "X");
  ovraxmp::XMPMeta onlyField =
      ovratest::Packet("<pt:Spot rdf:parseType=\"Resource\"><pt:X>1</pt:X></pt:Spot>");
  EXPECT_TRUE(DeleteValue(onlyField.GetInternalRef(), spotX));
  EXPECT_FALSE(HasValue(onlyField.GetInternalRef(), spot));

  ovraxmp::XMPMeta twoFields = ovratest::Packet(
      "<pt:Spot rdf:parseType=\"Resource\"><pt:X>1</pt:X><pt:Y>2</pt:Y></pt:Spot>");
  EXPECT_TRUE(DeleteValue(twoFields.GetInternalRef(), spotX));
  EXPECT_FALSE(HasValue(twoFields.GetInternalRef(), spotX));
  EXPECT_EQ(ovratest::Text(twoFields.GetInternalRef(), ovratest::FieldPath(spot, "PTPoint", "Y")), "2");

  const std::string inner = "<pt:Inner rdf:parseType=\"Resource\"><pt:X>1</pt:X></pt:Inner>";
  const Path outer = ovratest::TestPath("Outer");
  const Path x = ovratest::FieldPath(ovratest::FieldPath(outer, "PTOuter", "Inner"), "PTPoint", "X");
  ASSERT_FALSE(x.description.empty());
  ovraxmp::XMPMeta alone =
      ovratest::Packet("<pt:Outer rdf:parseType=\"Resource\">" + inner + "</pt:Outer>");
  EXPECT_TRUE(DeleteValue(alone.GetInternalRef(), x));
  EXPECT_FALSE(HasValue(alone.GetInternalRef(), outer));
  ovraxmp::XMPMeta tagged = ovratest::Packet("<pt:Outer rdf:parseType=\"Resource\">" + inner +
                                             "<pt:Tag>kept</pt:Tag></pt:Outer>");
  EXPECT_TRUE(DeleteValue(tagged.GetInternalRef(), x));
  EXPECT_FALSE(HasValue(tagged.GetInternalRef(), ovratest::FieldPath(outer, "PTOuter", "Inner")));
  EXPECT_EQ(ovratest::Text(tagged.GetInternalRef(), ovratest::FieldPath(outer, "PTOuter", "Tag")), "kept");
}

TEST(DeleteValue, OrdinaryPacketsGetNoDeletionRecord) {
  ovraxmp::XMPMeta meta = ovratest::Packet("<pt:Title>t</pt:Title>");
  EXPECT_TRUE(DeleteValue(meta.GetInternalRef(), ovratest::TestPath("Title")));
  EXPECT_FALSE(HasValue(meta.GetInternalRef(), ovratest::TestPath("Title")));
  EXPECT_FALSE(meta.DoesPropertyExist(kTransient, "DeletedProperties"));
}

TEST(DeleteValue, AggregatePacketsRecordEachDeletionInOrder) {
  ovraxmp::XMPMeta meta =
      AggregatePacket("<pt:Title>t</pt:Title><pt:Note>n</pt:Note><dc:format>x/y</dc:format>");
  EXPECT_TRUE(DeleteValue(meta.GetInternalRef(), ovratest::TestPath("Note")));
  EXPECT_TRUE(DeleteValue(meta.GetInternalRef(), ovratest::TestPath("Title")));
  const Path format =
      PathForSchemaNameAndPropertyName(UTF8String(ovraxmp::kXMP_NS_DC), "format");
  EXPECT_TRUE(DeleteValue(meta.GetInternalRef(), format));
  const auto records = DeletionRecords(meta);
  ASSERT_EQ(records.size(), 3u);
  EXPECT_EQ(records[0], std::make_pair(std::string(ovratest::kTestNS), std::string("pt:Note")));
  EXPECT_EQ(records[1], std::make_pair(std::string(ovratest::kTestNS), std::string("pt:Title")));
  EXPECT_EQ(records[2], std::make_pair(std::string(ovraxmp::kXMP_NS_DC), std::string("dc:format")));
}

TEST(DeleteValue, AMultiValuedPropertyStaysButLosesItsMarkAndIsRecorded) {
  ovraxmp::XMPMeta meta = AggregatePacket("<pt:Note>first file</pt:Note>");
  meta.SetMultiValued(ovratest::kTestNS, "Note");
  EXPECT_TRUE(DeleteValue(meta.GetInternalRef(), ovratest::TestPath("Note")));
  EXPECT_TRUE(HasValue(meta.GetInternalRef(), ovratest::TestPath("Note")));
  EXPECT_FALSE(meta.IsMultiValued(ovratest::kTestNS, "Note"));
  EXPECT_EQ(DeletionRecords(meta).size(), 1u);
}

TEST(DeleteValue, MissingPropertyOrNullPacketDeletesAndRecordsNothing) {
  ovraxmp::XMPMeta meta = AggregatePacket("<pt:Title>t</pt:Title>");
  EXPECT_FALSE(DeleteValue(meta.GetInternalRef(), ovratest::TestPath("Note")));
  EXPECT_FALSE(DeleteValue(nullptr, ovratest::TestPath("Title")));
  EXPECT_TRUE(DeletionRecords(meta).empty());
}

// ---------------------------------------------------------------------------
// Arrays

TEST(ArrayItems, CountAnswersZeroForWhatIsNoArray) {
  ovraxmp::XMPMeta meta = ovratest::Packet(Bag("Tags", {"a", "b", "c"}) + "<pt:Title>t</pt:Title>");
  EXPECT_EQ(CountArrayItems(meta.GetInternalRef(), ovratest::TestPath("Tags")), 3);
  EXPECT_EQ(CountArrayItems(meta.GetInternalRef(), ovratest::TestPath("Title")), 0);
  EXPECT_EQ(CountArrayItems(meta.GetInternalRef(), ovratest::TestPath("Steps")), 0);
  EXPECT_EQ(CountArrayItems(nullptr, ovratest::TestPath("Tags")), 0);
}

TEST(ArrayItems, AddTakesTheGivenPositionOrGoesBeforeTheLast) {
  ovraxmp::XMPMeta meta = ovratest::Packet(Bag("Steps", {"a", "b"}, "Seq"));
  const Path steps = ovratest::TestPath("Steps");
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), steps, 0));
  EXPECT_EQ(Items(meta, "Steps"), (std::vector<std::string>{"", "a", "b"}));
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), steps, -1));
  EXPECT_EQ(Items(meta, "Steps"), (std::vector<std::string>{"", "a", "", "b"}));
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), steps, 2));
  EXPECT_EQ(Items(meta, "Steps"), (std::vector<std::string>{"", "a", "", "", "b"}));
}

TEST(ArrayItems, AddToAnAbsentArrayCreatesItWithItsOrder) {
  ovraxmp::XMPMeta meta = ovratest::Packet("");
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), ovratest::TestPath("Steps"), 0));
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), ovratest::TestPath("Tags"), 0));
  EXPECT_EQ(Items(meta, "Steps"), std::vector<std::string>{""});
  EXPECT_EQ(Items(meta, "Tags"), std::vector<std::string>{""});
  EXPECT_NE(Options(meta, ovratest::kTestNS, "Steps") & ovraxmp::kXMP_PropArrayIsOrdered, 0u);
  EXPECT_NE(Options(meta, ovratest::kTestNS, "Tags") & ovraxmp::kXMP_PropValueIsArray, 0u);
  EXPECT_EQ(Options(meta, ovratest::kTestNS, "Tags") & ovraxmp::kXMP_PropArrayIsOrdered, 0u);
}

TEST(ArrayItems, ArraysOfStructuresGetStructureItems) {
  ovraxmp::XMPMeta meta = ovratest::Packet("");
  const Path points = ovratest::TestPath("Points");
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), points, 0));
  EXPECT_TRUE(AddArrayItem(meta.GetInternalRef(), points, 0));
  EXPECT_EQ(CountArrayItems(meta.GetInternalRef(), points), 2);
  EXPECT_NE(Options(meta, ovratest::kTestNS, "Points[1]") & ovraxmp::kXMP_PropValueIsStruct, 0u);
  EXPECT_NE(Options(meta, ovratest::kTestNS, "Points[2]") & ovraxmp::kXMP_PropValueIsStruct, 0u);
}

TEST(ArrayItems, NonArraysAndNullPacketsAreRefused) {
  ovraxmp::XMPMeta meta = ovratest::Packet("<pt:Title>t</pt:Title>");
  EXPECT_FALSE(AddArrayItem(meta.GetInternalRef(), ovratest::TestPath("Title"), 0));
  EXPECT_FALSE(DeleteArrayItem(meta.GetInternalRef(), ovratest::TestPath("Title"), 0));
  EXPECT_FALSE(AddArrayItem(nullptr, ovratest::TestPath("Tags"), 0));
  EXPECT_FALSE(DeleteArrayItem(nullptr, ovratest::TestPath("Tags"), 0));
  EXPECT_EQ(ovratest::Raw(meta.GetInternalRef(), ovratest::kTestNS, "Title"), "t");
}

TEST(ArrayItems, DeleteRemovesOneItemAndTheLastTakesThePropertyAlong) {
  ovraxmp::XMPMeta meta = AggregatePacket(Bag("Steps", {"a", "b", "c"}, "Seq"));
  const Path steps = ovratest::TestPath("Steps");
  EXPECT_TRUE(DeleteArrayItem(meta.GetInternalRef(), steps, 1));
  EXPECT_EQ(Items(meta, "Steps"), (std::vector<std::string>{"a", "c"}));
  EXPECT_TRUE(DeleteArrayItem(meta.GetInternalRef(), steps, -1));
  EXPECT_EQ(Items(meta, "Steps"), (std::vector<std::string>{"a"}));
  EXPECT_TRUE(DeletionRecords(meta).empty());
  EXPECT_TRUE(DeleteArrayItem(meta.GetInternalRef(), steps, 0));
  EXPECT_FALSE(HasValue(meta.GetInternalRef(), steps));
  ASSERT_EQ(DeletionRecords(meta).size(), 1u);
  EXPECT_EQ(DeletionRecords(meta)[0].second, "pt:Steps");
}

// ---------------------------------------------------------------------------
// Templates

TEST(Templates, EachOptionDoesItsPart) {
  const struct {
    TemplateImportOptions option;
    const char* tmpl;
    const char* title;  // expected afterwards, from "mine"
    const char* note;   // expected afterwards, from "my note"
    const char* count;  // expected afterwards, absent before
  } cases[] = {
      {TemplateReplaceAll, "<pt:Title>template</pt:Title><pt:Count>3</pt:Count>", "template", "<absent>",
       "<absent>"},
      {TemplateClearUnnamed, "<pt:Title>template</pt:Title>", "mine", "<absent>", "<absent>"},
      {TemplateReplaceDeleteEmpty, "<pt:Title></pt:Title><pt:Note>new note</pt:Note>", "<absent>", "new note",
       "<absent>"},
      // Unknown bits apply no flag at all.
      {static_cast<TemplateImportOptions>(3), "<pt:Title>template</pt:Title><pt:Count>3</pt:Count>", "mine",
       "my note", "<absent>"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.tmpl);
    ovraxmp::XMPMeta dest = ovratest::Packet("<pt:Title>mine</pt:Title><pt:Note>my note</pt:Note>");
    ovraxmp::XMPMeta tmpl = ovratest::Packet(c.tmpl);
    const std::string before = ovratest::Serialize(dest.GetInternalRef());
    EXPECT_TRUE(ApplyTemplate(dest.GetInternalRef(), tmpl.GetInternalRef(), c.option));
    EXPECT_EQ(ovratest::Raw(dest.GetInternalRef(), ovratest::kTestNS, "Title"), c.title);
    EXPECT_EQ(ovratest::Raw(dest.GetInternalRef(), ovratest::kTestNS, "Note"), c.note);
    EXPECT_EQ(ovratest::Raw(dest.GetInternalRef(), ovratest::kTestNS, "Count"), c.count);
    if (c.option == static_cast<TemplateImportOptions>(3)) {
      EXPECT_EQ(ovratest::Serialize(dest.GetInternalRef()), before);
    }
  }
  ovraxmp::XMPMeta some = ovratest::Packet("<pt:Title>t</pt:Title>");
  EXPECT_FALSE(ApplyTemplate(nullptr, some.GetInternalRef(), TemplateReplaceAll));
  EXPECT_FALSE(ApplyTemplate(some.GetInternalRef(), nullptr, TemplateReplaceAll));
}

// ---------------------------------------------------------------------------
// Minimal float

TEST(SetMinimalFloatValue, StoresSeventeenDigitsOnceAndWritesBackThroughTheProvider) {
  auto provider = RecordingBufferProvider::FromProperties("");
  const Value value{ovratest::TestPath("Ratio"), provider};
  SetMinimalFloatValue(value, 0.1);
  EXPECT_EQ(ovratest::Raw(provider->MetaDataAccess(), ovratest::kTestNS, "Ratio"),
            "0.10000000000000001");
  ASSERT_EQ(provider->writes.size(), 1u);
  ASSERT_EQ(provider->writes[0].changes.size(), 1u);
  EXPECT_EQ(provider->writes[0].changes[0].description, "Ratio");
  SetMinimalFloatValue(value, 0.1);
  EXPECT_EQ(provider->writes.size(), 1u);
  SetMinimalFloatValue(value, 2.5);
  EXPECT_EQ(ovratest::Raw(provider->MetaDataAccess(), ovratest::kTestNS, "Ratio"), "2.5");
  EXPECT_EQ(provider->writes.size(), 2u);
}

TEST(SetMinimalFloatValue, AMultiValuedNumberIsAlwaysWrittenAndUnmarked) {
  auto provider = RecordingBufferProvider::FromProperties("<pt:Ratio>0.5</pt:Ratio>");
  ovraxmp::XMPMeta(provider->MetaDataAccess()).SetMultiValued(ovratest::kTestNS, "Ratio");
  SetMinimalFloatValue(Value{ovratest::TestPath("Ratio"), provider}, 0.5);
  EXPECT_EQ(provider->writes.size(), 1u);
  EXPECT_FALSE(
      ovraxmp::XMPMeta(provider->MetaDataAccess()).IsMultiValued(ovratest::kTestNS, "Ratio"));
}

TEST(SetMinimalFloatValue, FailuresAreReportedNotThrown) {
  auto provider = RecordingBufferProvider::FromProperties("<pt:Ratio>not a number</pt:Ratio>");
  ovratest::ErrorsSince errors;
  EXPECT_NO_THROW(SetMinimalFloatValue(Value{ovratest::TestPath("Ratio"), provider}, 1.0));
  const auto reported = errors.New();
  ASSERT_EQ(reported.size(), 1u);
  EXPECT_EQ(reported[0].type, kErrorWritingXMP);
  EXPECT_NE(ovracore::ToUTF8(reported[0].message)
                .find(std::string("invalid data in \"") + ovratest::kTestNS + "Ratio\""),
            std::string::npos);
  EXPECT_TRUE(provider->writes.empty());
  // Without provider nothing happens at all.
  EXPECT_NO_THROW(SetMinimalFloatValue(Value{ovratest::TestPath("Ratio"), nullptr}, 1.0));
}

}  // namespace
