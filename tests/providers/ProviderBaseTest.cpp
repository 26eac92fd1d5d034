// The provider bases: guards, write-back driver, notifications, dynamic
// schemas.
#include <gtest/gtest.h>

#include <boost/make_shared.hpp>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Providers.h>

#include "ProviderTestSupport.h"

namespace {

using namespace ovrametadata;
using ovratest::CallCounter;
using ovratest::WritingDisabledScope;
using ovratest::RecordingBufferProvider;

const std::string kTitled = "<pt:Title>first</pt:Title>";

// The "changed" text of the last history event of a serialised packet.
std::string LastChangedParts(const std::string& bytes) {
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(bytes);
  const std::string item =
      ovraxmp::XMPUtils::ComposeArrayItemPath(ovraxmp::kXMP_NS_XMP_MM, "History", ovraxmp::kXMP_ArrayLastItem);
  return meta.GetStructField(ovraxmp::kXMP_NS_XMP_MM, item, ovraxmp::kXMP_NS_XMP_ResourceEvent, "changed")
      .value_or(ovraxmp::XMP_Node())
      .value;
}

// A provider that claims to write its own change list.
class SelfRecordingProvider : public RecordingBufferProvider {
 public:
  SelfRecordingProvider() : RecordingBufferProvider(ovratest::PacketText(kTitled)) {}
  bool WritesOwnChangeList() override { return true; }
};

class TestProxy : public ProxyProviderImpl {
 public:
  void WriteChanges(const std::vector<Path>&) override {}
  void OnProxyMetaDataChange(XMPMetaRef changed) override {
    ++rebuilds;
    lastChanged = changed;
  }
  int rebuilds = 0;
  XMPMetaRef lastChanged = nullptr;
};

// ---------------------------------------------------------------------------
// Update guards and the write-back driver

TEST(UpdateGuard, EmptyChangeListWritesAndNotifiesNothing) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter counter;
  provider->NotifyWhenMetaDataChanged(counter.callback);
  { MetaDataUpdateAccess access(provider); }
  EXPECT_TRUE(provider->writes.empty());
  EXPECT_EQ(*counter.calls, 0);
}

TEST(UpdateGuard, ProviderWithoutMetadataWritesNothing) {
  auto provider = boost::make_shared<RecordingBufferProvider>("not xmp at all");
  ASSERT_EQ(provider->MetaDataAccess(), nullptr);
  {
    MetaDataUpdateAccess access(provider);
    EXPECT_EQ(*access, nullptr);
    access.AddChange(ovratest::TestPath("Title"));
    EXPECT_TRUE(access.HasChanges());
  }
  EXPECT_TRUE(provider->writes.empty());
}

TEST(UpdateGuard, WritesTheChangedPathsInOrderWithDuplicates) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  const Path title = ovratest::TestPath("Title");
  const Path note = ovratest::TestPath("Note");
  {
    MetaDataUpdateAccess access(provider);
    ASSERT_TRUE(SetValue(*access, title, UTF8String("second")));
    ASSERT_TRUE(SetValue(*access, note, UTF8String("a note")));
    access.AddChange(title);
    access.AddChange(note);
    access.AddChange(title);
  }
  ASSERT_EQ(provider->writes.size(), 1u);
  const auto& changes = provider->writes[0].changes;
  ASSERT_EQ(changes.size(), 3u);
  EXPECT_EQ(changes[0].description, "Title");
  EXPECT_EQ(changes[1].description, "Note");
  EXPECT_EQ(changes[2].description, "Title");
  EXPECT_EQ(ovratest::WrittenRaw(provider->writes[0], ovratest::kTestNS, "Title"), "second");
  EXPECT_EQ(ovratest::WrittenRaw(provider->writes[0], ovratest::kTestNS, "Note"), "a note");
}

TEST(UpdateGuard, RecordsOneHistoryPartPerChangedPath) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  Path unknown;
  unknown.namespaceURI = "http://ns.example.org/not-registered/";
  unknown.description = "Whatever";
  {
    MetaDataUpdateAccess access(provider);
    access.AddChange(ovratest::TestPath("Title"));
    access.AddChange(unknown);
  }
  ASSERT_EQ(provider->writes.size(), 1u);
  // A registered schema names its prefix and the path; an unknown one is
  // the bare metadata part.
  EXPECT_EQ(LastChangedParts(provider->writes[0].bytes), "/metadata/pt/Title;/metadata");
}

TEST(UpdateGuard, ProviderWritingItsOwnChangeListGetsNoHistory) {
  auto provider = boost::make_shared<SelfRecordingProvider>();
  ovratest::Touch(provider, ovratest::TestPath("Title"));
  ASSERT_EQ(provider->writes.size(), 1u);
  EXPECT_EQ(provider->writes[0].bytes.find("History"), std::string::npos);
}

TEST(UpdateGuard, KeepsProviderAndPacketAliveAfterTheOwnerLetsGo) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  RecordingBufferProvider* raw = provider.get();
  std::vector<RecordingBufferProvider::Write>* writes = &raw->writes;
  bool wrote = false;
  raw->duringWrite = [&wrote] { wrote = true; };
  {
    MetaDataUpdateAccess access(provider);
    provider.reset();
    ASSERT_NE(*access, nullptr);
    EXPECT_TRUE(SetValue(*access, ovratest::TestPath("Title"), UTF8String("late")));
    access.AddChange(ovratest::TestPath("Title"));
    EXPECT_EQ(writes->size(), 0u);
  }
  EXPECT_TRUE(wrote);
}

TEST(ReadGuard, KeepsItsPacketWhenTheProviderReplacesIt) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  MetaDataReadAccess read(provider);
  const XMPMetaRef held = *read;
  const std::int32_t before = ovraxmp::XMPMetaRefGetCount(held);
  provider->ResetToEmptyMetaData(false);
  EXPECT_NE(provider->MetaDataAccess(), held);
  EXPECT_EQ(ovraxmp::XMPMetaRefGetCount(held), before - 1);
  EXPECT_EQ(ovratest::Raw(held, ovratest::kTestNS, "Title"), "first");
  // The provider is the only owner of its new empty packet.
  EXPECT_EQ(ovraxmp::XMPMetaRefGetCount(provider->MetaDataAccess()), 1);
}

TEST(TypicalProvider, ResettingToTheSameHandleKeepsThePacket) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  const XMPMetaRef xmp = provider->MetaDataAccess();
  provider->ResetMetaData(xmp, false);
  ASSERT_EQ(provider->MetaDataAccess(), xmp);
  EXPECT_EQ(ovraxmp::XMPMetaRefGetCount(xmp), 1);
  EXPECT_EQ(ovratest::Raw(xmp, ovratest::kTestNS, "Title"), "first");
}

TEST(QueryPathStatus, DisabledWritingRefusesOnlyTheWriteStatus) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  const Path title = ovratest::TestPath("Title");
  EXPECT_TRUE(provider->QueryPathStatus(title, kPathStatusWritable));
  WritingDisabledScope disabled;
  EXPECT_FALSE(provider->QueryPathStatus(title, kPathStatusWritable));
  EXPECT_TRUE(provider->QueryPathStatus(title, kPathStatusReadable));
  EXPECT_TRUE(provider->QueryPathStatus(title, static_cast<PathStatus>(7)));
}

// ---------------------------------------------------------------------------
// Notifications

TEST(Notifications, EveryReplacementCallsTheCallbacksWithTheNewPacket) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter counter;
  provider->NotifyWhenMetaDataChanged(counter.callback);
  const std::string text = ovratest::PacketText("<pt:Title>other</pt:Title>");
  provider->ResetBuffer(reinterpret_cast<const unsigned char*>(text.data()), text.size());
  provider->ResetMetaData(nullptr, true);
  provider->ResetMetaData(nullptr, false);
  ASSERT_EQ(*counter.calls, 2);
  EXPECT_NE((*counter.handles)[0], nullptr);
  EXPECT_EQ((*counter.handles)[1], nullptr);
}

TEST(Notifications, WithdrawnCallbackIsSkippedAndPurgedAtTheNextRegistration) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter withdrawn, kept;
  provider->NotifyWhenMetaDataChanged(withdrawn.callback);
  provider->NotifyWhenMetaDataChanged(kept.callback);
  *withdrawn.callback = nullptr;
  provider->MetaDataChanged();
  EXPECT_EQ(*withdrawn.calls, 0);
  EXPECT_EQ(*kept.calls, 1);
  EXPECT_EQ(withdrawn.callback.use_count(), 2);  // still listed
  CallCounter later;
  provider->NotifyWhenMetaDataChanged(later.callback);
  EXPECT_EQ(withdrawn.callback.use_count(), 1);  // purged
  EXPECT_EQ(kept.callback.use_count(), 2);
}

TEST(Notifications, SameCallbackTwiceIsCalledTwiceAndRemovedOneAtATime) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter counter;
  provider->NotifyWhenMetaDataChanged(counter.callback);
  provider->NotifyWhenMetaDataChanged(counter.callback);
  provider->MetaDataChanged();
  EXPECT_EQ(*counter.calls, 2);
  provider->RemoveMetaDataChangedNotification(counter.callback);
  provider->MetaDataChanged();
  EXPECT_EQ(*counter.calls, 3);
  provider->RemoveMetaDataChangedNotification(counter.callback);
  provider->RemoveMetaDataChangedNotification(counter.callback);
  provider->MetaDataChanged();
  EXPECT_EQ(*counter.calls, 3);
}

TEST(Notifications, CallbacksMayRegisterAndWithdrawWhileBeingCalled) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter added, second;
  int firstCalls = 0;
  auto first = std::make_shared<MetaDataChangedCallback>();
  *first = [&](XMPMetaRef) {
    ++firstCalls;
    if (firstCalls == 1) {
      provider->NotifyWhenMetaDataChanged(added.callback);
      *second.callback = nullptr;  // withdraws the next one mid-round
    }
  };
  provider->NotifyWhenMetaDataChanged(first);
  provider->NotifyWhenMetaDataChanged(second.callback);
  provider->MetaDataChanged();
  EXPECT_EQ(firstCalls, 1);
  EXPECT_EQ(*second.calls, 0);
  EXPECT_EQ(*added.calls, 0);  // not in this round's snapshot
  provider->MetaDataChanged();
  EXPECT_EQ(firstCalls, 2);
  EXPECT_EQ(*added.calls, 1);
}

TEST(Notifications, DestroyedProviderWithdrawsEveryCallback) {
  CallCounter counter;
  {
    auto provider = RecordingBufferProvider::FromProperties(kTitled);
    provider->NotifyWhenMetaDataChanged(counter.callback);
  }
  EXPECT_FALSE(static_cast<bool>(*counter.callback));
}

TEST(Notifications, OwnWriteBackThatReplacesThePacketAnnouncesNothing) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter counter;
  provider->NotifyWhenMetaDataChanged(counter.callback);
  RecordingBufferProvider* raw = provider.get();
  int nestedWrites = 0;
  raw->duringWrite = [raw, provider, &nestedWrites] {
    raw->ResetToEmptyMetaData(true);  // like a reload after writing
    // A guard opened from inside the write-back does not write again.
    MetaDataUpdateAccess nested(provider);
    nested.AddChange(ovratest::TestPath("Note"));
    ++nestedWrites;
  };
  ovratest::Touch(provider, ovratest::TestPath("Title"));
  raw->duringWrite = nullptr;
  EXPECT_EQ(nestedWrites, 1);
  EXPECT_EQ(provider->writes.size(), 1u);
  EXPECT_EQ(*counter.calls, 0);
  // After the write-back the provider announces again.
  provider->ResetToEmptyMetaData(true);
  EXPECT_EQ(*counter.calls, 1);
}

// ---------------------------------------------------------------------------
// Dynamic schemas

TEST(DynamicSchemas, SameNamespaceIsAddedOnceAndRegisteredGlobally) {
  auto provider = RecordingBufferProvider::FromProperties(kTitled);
  const UTF8String uri = MakeDynamicSchemaNamespace("provider-tests/clips");
  auto schema = CreateNewSchema(uri, "clipsA", u"clips", u"clips", u"", u"");
  auto twin = CreateNewSchema(uri, "clipsB", u"clips", u"clips", u"", u"");
  EXPECT_FALSE(provider->DoesDynamicNamespaceExist(uri));
  provider->AddDynamicSchemaDefinition(schema);
  provider->AddDynamicSchemaDefinition(twin);
  provider->AddDynamicSchemaDefinition(boost::shared_ptr<SchemaDefinition>());
  EXPECT_TRUE(provider->DoesDynamicNamespaceExist(uri));
  std::vector<boost::shared_ptr<SchemaDefinition>> listed;
  for (const auto& s : provider->DynamicSchemaDefinitions()) listed.push_back(s);
  ASSERT_EQ(listed.size(), 1u);
  EXPECT_EQ(listed[0], schema);
  EXPECT_EQ(NamespaceDefinition(uri), schema);
}

// ---------------------------------------------------------------------------
// Proxy base

TEST(ProxyProvider, WritesOwnChangeListOnlyWhenEveryMemberDoes) {
  TestProxy proxy;
  EXPECT_TRUE(proxy.WritesOwnChangeList());
  proxy.AddProxyProvider(boost::make_shared<SelfRecordingProvider>());
  EXPECT_TRUE(proxy.WritesOwnChangeList());
  proxy.AddProxyProvider(RecordingBufferProvider::FromProperties(kTitled));
  EXPECT_FALSE(proxy.WritesOwnChangeList());
  proxy.AddProxyProvider(boost::shared_ptr<MetaDataProvider>());
  EXPECT_FALSE(proxy.WritesOwnChangeList());
}

TEST(ProxyProvider, IsToldOfMemberChangesUntilItGoes) {
  auto member = RecordingBufferProvider::FromProperties(kTitled);
  CallCounter client;
  member->NotifyWhenMetaDataChanged(client.callback);
  {
    TestProxy proxy;
    proxy.AddProxyProvider(member);
    member->ResetToEmptyMetaData(true);
    EXPECT_EQ(proxy.rebuilds, 1);
    EXPECT_EQ(proxy.lastChanged, member->MetaDataAccess());
    // Forgetting the members keeps the callback registered with them.
    proxy.ResetProxyProviders();
    member->ResetToEmptyMetaData(true);
    EXPECT_EQ(proxy.rebuilds, 2);
  }
  // The destroyed proxy's callback is withdrawn; the client's stays.
  member->ResetToEmptyMetaData(true);
  EXPECT_EQ(*client.calls, 3);
}

}  // namespace
