// The aggregate provider over files and buffers: merged reads, distributed
// write-back, deletions, refusing members, rebuilds and dynamic schemas.
#include <gtest/gtest.h>

#include <boost/make_shared.hpp>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/ValueEditing.h>
#include <ovrametadata/Values.h>

#include "ProviderTestSupport.h"
#include "TestSupport.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ovratest::CallCounter;
using ovratest::MediaKind;
using ovratest::RecordingBufferProvider;
using ProviderPtr = boost::shared_ptr<MetaDataProvider>;

Range<ProviderPtr> AsRange(const std::vector<ProviderPtr>& providers) {
  return Range<ProviderPtr>(providers);
}

// A file provider that refuses to write anything.
class RefusingFileProvider : public FileProvider {
 public:
  using FileProvider::FileProvider;
  bool QueryPathStatus(const Path& path, PathStatus status) const override {
    return status != kPathStatusWritable && FileProvider::QueryPathStatus(path, status);
  }
};

// Lets a test put null entries into the member list.
class OpenAggregate : public AggregateProvider {
 public:
  std::vector<ProviderPtr>& Members() { return mProviders; }
};

// Three files of three formats: an equal title, differing notes, a count
// missing from the second file.
class AggregateOverFiles : public ::testing::Test {
 protected:
  void SetUp() override {
    files = {
        ovratest::MakeMediaFile(dir.path(), "one", MediaKind::JPEG,
                                "<pt:Title>same</pt:Title><pt:Note>a</pt:Note><pt:Count>1</pt:Count>"),
        ovratest::MakeMediaFile(dir.path(), "two", MediaKind::MP4,
                                "<pt:Title>same</pt:Title><pt:Note>b</pt:Note>"),
        ovratest::MakeMediaFile(dir.path(), "three", MediaKind::WAV,
                                "<pt:Title>same</pt:Title><pt:Note>c</pt:Note><pt:Count>1</pt:Count>"),
    };
    for (const fs::path& file : files) members.push_back(ovratest::OpenFile(file));
    aggregate = boost::make_shared<AggregateProvider>(AsRange(members));
  }

  std::string FileText(std::size_t index, const Path& path) {
    auto fresh = ovratest::OpenFile(files[index]);
    return ovratest::Text(fresh->MetaDataAccess(), path);
  }
  bool FileHas(std::size_t index, const Path& path) {
    auto fresh = ovratest::OpenFile(files[index]);
    return HasValue(fresh->MetaDataAccess(), path);
  }

  ovratest::TempDir dir;
  std::vector<fs::path> files;
  std::vector<ProviderPtr> members;
  boost::shared_ptr<AggregateProvider> aggregate;
  const Path title = ovratest::TestPath("Title");
  const Path note = ovratest::TestPath("Note");
  const Path count = ovratest::TestPath("Count");
};

TEST_F(AggregateOverFiles, ReadsEqualValuesAndMarksDifferingOrMissingOnesMixed) {
  MetaDataReadAccess read(aggregate);
  ASSERT_NE(*read, nullptr);
  EXPECT_EQ(ovratest::ResultOf(*read, title), ValueFound);
  EXPECT_EQ(ovratest::Text(*read, title), "same");
  EXPECT_EQ(ovratest::ResultOf(*read, note), ValueMixed);
  EXPECT_EQ(ovratest::ResultOf(*read, count), ValueMixed);
  EXPECT_EQ(ovratest::ResultOf(*read, ovratest::TestPath("Ratio")), ValueAbsent);
}

TEST_F(AggregateOverFiles, AnEditReachesEveryFileAndMixedValuesStayPerFile) {
  ASSERT_TRUE(ovratest::Edit(aggregate, title, "renamed"));
  for (std::size_t i = 0; i < files.size(); ++i) {
    EXPECT_EQ(FileText(i, title), "renamed") << files[i];
  }
  EXPECT_EQ(FileText(0, note), "a");
  EXPECT_EQ(FileText(1, note), "b");
  EXPECT_EQ(FileText(2, note), "c");
  EXPECT_FALSE(FileHas(1, count));
}

TEST_F(AggregateOverFiles, AClearedValueDeletesThePropertyEverywhere) {
  ASSERT_TRUE(ovratest::Edit(aggregate, title, ""));
  for (std::size_t i = 0; i < files.size(); ++i) EXPECT_FALSE(FileHas(i, title)) << files[i];
  EXPECT_EQ(FileText(1, note), "b");
}

TEST_F(AggregateOverFiles, AStructureGivenAsAChangeWasDeletedFromEveryFile) {
  const Path spot = ovratest::TestPath("Spot"), points = ovratest::TestPath("Points");
  {
    MetaDataUpdateAccess access(aggregate);
    ovraxmp::XMPMeta meta(*access);
    meta.SetStructField(ovratest::kTestNS, "Spot", ovratest::kTestNS, "X", "1");
    meta.AppendArrayItem(ovratest::kTestNS, "Points", ovraxmp::kXMP_PropArrayIsOrdered, "",
                         ovraxmp::kXMP_PropValueIsStruct);
    meta.SetStructField(ovratest::kTestNS, "Points[1]", ovratest::kTestNS, "Y", "2");
    access.AddChange(spot);
    access.AddChange(points);
  }
  for (std::size_t i = 0; i < files.size(); ++i) {
    EXPECT_TRUE(FileHas(i, spot)) << files[i];
    EXPECT_TRUE(FileHas(i, points)) << files[i];
  }
}

TEST_F(AggregateOverFiles, ADeletionRecordIsAppliedToEveryFile) {
  {
    MetaDataUpdateAccess access(aggregate);
    // Deleting a mixed value keeps it in the aggregate but records it.
    ASSERT_TRUE(DeleteValue(*access, note));
    EXPECT_EQ(ovratest::ResultOf(*access, note), ValueFound);
    access.AddChange(note);
  }
  for (std::size_t i = 0; i < files.size(); ++i) {
    EXPECT_FALSE(FileHas(i, note)) << files[i];
    EXPECT_EQ(FileText(i, title), "same");
  }
}

TEST_F(AggregateOverFiles, AMemberThatRefusesAPathIsLeftUntouched) {
  const fs::path refusingFile = ovratest::MakeMediaFile(
      dir.path(), "refusing", MediaKind::JPEG, "<pt:Title>same</pt:Title><pt:Note>r</pt:Note>");
  const std::string before = ovratest::ReadFile(refusingFile);
  auto refusing = boost::make_shared<RefusingFileProvider>(ovratest::U16Path(refusingFile));
  aggregate->AddProvider(refusing, true);
  EXPECT_TRUE(aggregate->QueryPathStatus(title, kPathStatusWritable));
  ASSERT_TRUE(ovratest::Edit(aggregate, title, "renamed"));
  EXPECT_EQ(ovratest::ReadFile(refusingFile), before);
  EXPECT_EQ(FileText(0, title), "renamed");
  EXPECT_EQ(FileText(2, title), "renamed");
}

TEST_F(AggregateOverFiles, RebuildsAndNotifiesWhenAMemberChanges) {
  CallCounter counter;
  aggregate->NotifyWhenMetaDataChanged(counter.callback);
  ovratest::PutXMPIntoFile(files[1], ovratest::Packet("<pt:Title>other</pt:Title>"));
  boost::static_pointer_cast<FileProvider>(members[1])->ReloadFile();
  EXPECT_EQ(*counter.calls, 1);
  MetaDataReadAccess read(aggregate);
  EXPECT_EQ(ovratest::ResultOf(*read, title), ValueMixed);
  EXPECT_EQ((*counter.handles)[0], *read);
}

// ---------------------------------------------------------------------------
// Buffers and the edge cases of the member list

TEST(AggregateProvider, WithoutMembersThereIsNothingToReadOrWrite) {
  auto aggregate = boost::make_shared<AggregateProvider>();
  EXPECT_EQ(aggregate->MetaDataAccess(), nullptr);
  EXPECT_FALSE(aggregate->QueryPathStatus(ovratest::TestPath("Title"), kPathStatusReadable));
  EXPECT_NO_THROW(aggregate->WriteChanges({ovratest::TestPath("Title")}));
}

TEST(AggregateProvider, OneMemberSharesItsPacketAndWritesThroughOneGuard) {
  auto member = RecordingBufferProvider::FromProperties("<pt:Title>solo</pt:Title>");
  auto aggregate = boost::make_shared<AggregateProvider>();
  aggregate->AddProvider(member, true);
  EXPECT_EQ(aggregate->MetaDataAccess(), member->MetaDataAccess());
  ASSERT_TRUE(ovratest::Edit(aggregate, ovratest::TestPath("Title"), "edited"));
  ASSERT_EQ(member->writes.size(), 1u);
  ASSERT_EQ(member->writes[0].changes.size(), 1u);
  EXPECT_EQ(ovratest::Text(member->MetaDataAccess(), ovratest::TestPath("Title")), "edited");
}

TEST(AggregateProvider, MembersWithoutMetadataGiveNullMetadata) {
  auto a = boost::make_shared<RecordingBufferProvider>("garbage");
  auto b = boost::make_shared<RecordingBufferProvider>("garbage");
  AggregateProvider aggregate(AsRange({a, b}));
  EXPECT_EQ(aggregate.MetaDataAccess(), nullptr);
}

TEST(AggregateProvider, ANullEntryForgetsWhatWasCollectedBeforeIt) {
  auto collected = RecordingBufferProvider::FromProperties("<pt:Title>A</pt:Title>");
  auto empty = boost::make_shared<RecordingBufferProvider>("garbage");
  auto later = RecordingBufferProvider::FromProperties("<pt:Title>B</pt:Title>");
  OpenAggregate aggregate;
  aggregate.Members() = {collected, ProviderPtr(), empty};
  aggregate.OnProxyMetaDataChange(nullptr);
  EXPECT_EQ(aggregate.MetaDataAccess(), nullptr);

  aggregate.Members() = {collected, ProviderPtr(), later};
  aggregate.OnProxyMetaDataChange(nullptr);
  ASSERT_NE(aggregate.MetaDataAccess(), nullptr);
  // The first member was still merged (only the flag is reset), so the
  // titles differ.
  EXPECT_EQ(ovratest::ResultOf(aggregate.MetaDataAccess(), ovratest::TestPath("Title")),
            ValueMixed);
}

TEST(AggregateProvider, ResetProvidersReplacesTheMembersAndNotifies) {
  auto a = RecordingBufferProvider::FromProperties("<pt:Title>A</pt:Title>");
  auto b = RecordingBufferProvider::FromProperties("<pt:Title>A</pt:Title>");
  AggregateProvider aggregate(AsRange({a, b}));
  CallCounter counter;
  aggregate.NotifyWhenMetaDataChanged(counter.callback);
  ASSERT_NE(aggregate.MetaDataAccess(), nullptr);
  aggregate.ResetProviders();
  EXPECT_EQ(aggregate.MetaDataAccess(), nullptr);
  EXPECT_EQ(*counter.calls, 1);
  aggregate.ResetProviders(AsRange({a, ProviderPtr(), b}));
  EXPECT_EQ(*counter.calls, 2);
  EXPECT_EQ(ovratest::Text(aggregate.MetaDataAccess(), ovratest::TestPath("Title")), "A");
}

TEST(AggregateProvider, WriteBackSkipsMembersWithoutMetadata) {
  auto a = RecordingBufferProvider::FromProperties("<pt:Title>A</pt:Title>");
  auto none = boost::make_shared<RecordingBufferProvider>("garbage");
  auto b = RecordingBufferProvider::FromProperties("<pt:Title>A</pt:Title>");
  auto aggregate = boost::make_shared<AggregateProvider>(AsRange({a, none, b}));
  ASSERT_TRUE(ovratest::Edit(aggregate, ovratest::TestPath("Title"), "Z"));
  EXPECT_EQ(a->writes.size(), 1u);
  EXPECT_EQ(b->writes.size(), 1u);
  EXPECT_TRUE(none->writes.empty());
  EXPECT_EQ(ovratest::Text(b->MetaDataAccess(), ovratest::TestPath("Title")), "Z");
}

// ---------------------------------------------------------------------------
// Dynamic schemas

std::string DynamicPacket(const std::string& uri, const std::string& prefix,
                          const std::string& properties) {
  return "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF "
         "xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\"><rdf:Description "
         "rdf:about=\"\" xmlns:" +
         prefix + "=\"" + uri + "\">" + properties + "</rdf:Description></rdf:RDF></x:xmpmeta>";
}

TEST(AggregateProvider, DiscoversDynamicSchemasFromTheFirstPropertyPrefix) {
  const UTF8String uri = MakeDynamicSchemaNamespace("aggregate-tests/shots");
  auto a = boost::make_shared<RecordingBufferProvider>(
      DynamicPacket(uri, "shots", "<shots:Scene>1</shots:Scene><shots:Take>2</shots:Take>"));
  auto b = boost::make_shared<RecordingBufferProvider>(
      DynamicPacket(uri, "shots", "<shots:Take>3</shots:Take><shots:Camera>B</shots:Camera>"));
  AggregateProvider aggregate(AsRange({a, b}));
  ASSERT_TRUE(aggregate.DoesDynamicNamespaceExist(uri));
  std::vector<boost::shared_ptr<SchemaDefinition>> schemas;
  for (const auto& s : aggregate.DynamicSchemaDefinitions()) {
    if (s->namespaceURI == uri) schemas.push_back(s);
  }
  ASSERT_EQ(schemas.size(), 1u);
  EXPECT_EQ(schemas[0]->prefix, "shots");
  EXPECT_EQ(schemas[0]->label, u"shots");
  EXPECT_EQ(schemas[0]->description, ovracore::ToUTF16(uri));

  std::vector<boost::shared_ptr<PropertyDefinition>> properties(3);
  aggregate.GetAllPathsForDynamicSchema(uri, properties);
  std::vector<std::string> names;
  for (const auto& p : properties) {
    names.push_back(p->name);
    EXPECT_EQ(p->type.value_or(""), "text");
  }
  EXPECT_EQ(names, (std::vector<std::string>{"Scene", "Take", "Camera"}));
}

}  // namespace
