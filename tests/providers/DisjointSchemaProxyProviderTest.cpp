// The disjoint-schema proxy: the union view and the routing of writes.
#include <gtest/gtest.h>

#include <boost/make_shared.hpp>
#include <boost/smart_ptr/owner_less.hpp>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/Values.h>

#include "ProviderTestSupport.h"

namespace {

using namespace ovrametadata;
using ovratest::CallCounter;
using ovratest::RecordingBufferProvider;
using ovratest::WrittenRaw;

class DisjointProxy : public ::testing::Test {
 protected:
  void SetUp() override {
    base = RecordingBufferProvider::FromProperties(
        "<pt:Title>base title</pt:Title><pt:Note>base note</pt:Note>");
    routed = RecordingBufferProvider::FromProperties(
        "<pu:Title>routed title</pu:Title><pu:Owner>someone</pu:Owner>");
    otherSchema = NamespaceDefinition(ovratest::kOtherNS);
    ASSERT_TRUE(otherSchema);
    proxy = boost::make_shared<DisjointSchemaProxyProvider>();
    proxy->RegisterBaseProvider(base);
    proxy->RegisterProvider(otherSchema, routed);
  }

  void Edit(const Path& path, const std::string& value) { ASSERT_TRUE(ovratest::Edit(proxy, path, value)); }

  boost::shared_ptr<RecordingBufferProvider> base, routed;
  boost::shared_ptr<SchemaDefinition> otherSchema;
  boost::shared_ptr<DisjointSchemaProxyProvider> proxy;
};

TEST_F(DisjointProxy, ShowsTheUnionInTheBasePacketItself) {
  MetaDataReadAccess read(proxy);
  EXPECT_EQ(*read, base->MetaDataAccess());
  EXPECT_EQ(ovratest::Text(*read, ovratest::TestPath("Title")), "base title");
  EXPECT_EQ(ovratest::Text(*read, ovratest::OtherPath("Title")), "routed title");
}

TEST_F(DisjointProxy, AChangeInARoutedSchemaReachesOnlyItsProvider) {
  Edit(ovratest::OtherPath("Owner"), "new owner");
  ASSERT_EQ(routed->writes.size(), 1u);
  EXPECT_TRUE(base->writes.empty());
  EXPECT_EQ(WrittenRaw(routed->writes[0], ovratest::kOtherNS, "Owner"), "new owner");
  EXPECT_EQ(WrittenRaw(routed->writes[0], ovratest::kOtherNS, "Title"), "routed title");
  EXPECT_EQ(WrittenRaw(routed->writes[0], ovratest::kTestNS, "Title"), "<absent>");
}

TEST_F(DisjointProxy, OtherChangesReachTheBaseWithoutTheRoutedSchemas) {
  Edit(ovratest::TestPath("Note"), "edited note");
  ASSERT_EQ(base->writes.size(), 1u);
  EXPECT_TRUE(routed->writes.empty());
  EXPECT_EQ(WrittenRaw(base->writes[0], ovratest::kTestNS, "Note"), "edited note");
  EXPECT_EQ(WrittenRaw(base->writes[0], ovratest::kOtherNS, "Title"), "<absent>");
  EXPECT_EQ(WrittenRaw(base->writes[0], ovratest::kOtherNS, "Owner"), "<absent>");
  // The view is complete again afterwards.
  EXPECT_EQ(ovratest::Text(proxy->MetaDataAccess(), ovratest::OtherPath("Owner")), "someone");
}

TEST_F(DisjointProxy, AMixedChangeListIsSplitByOwner) {
  {
    MetaDataUpdateAccess access(proxy);
    ASSERT_TRUE(SetValue(*access, ovratest::OtherPath("Title"), UTF8String("r2")));
    ASSERT_TRUE(SetValue(*access, ovratest::TestPath("Title"), UTF8String("b2")));
    access.AddChange(ovratest::OtherPath("Title"));
    access.AddChange(ovratest::TestPath("Title"));
  }
  ASSERT_EQ(routed->writes.size(), 1u);
  ASSERT_EQ(base->writes.size(), 1u);
  ASSERT_EQ(routed->writes[0].changes.size(), 1u);
  EXPECT_EQ(routed->writes[0].changes[0].namespaceURI, ovratest::kOtherNS);
  ASSERT_EQ(base->writes[0].changes.size(), 1u);
  EXPECT_EQ(base->writes[0].changes[0].namespaceURI, ovratest::kTestNS);
  EXPECT_EQ(WrittenRaw(routed->writes[0], ovratest::kOtherNS, "Title"), "r2");
  EXPECT_EQ(WrittenRaw(base->writes[0], ovratest::kTestNS, "Title"), "b2");
}

TEST_F(DisjointProxy, QueryPathStatusAsksTheOwner) {
  class Refusing : public RecordingBufferProvider {
   public:
    Refusing() : RecordingBufferProvider(ovratest::PacketText("")) {}
    bool QueryPathStatus(const Path&, PathStatus) const override { return false; }
  };
  proxy->RegisterProvider(otherSchema, boost::make_shared<Refusing>());
  EXPECT_FALSE(proxy->QueryPathStatus(ovratest::OtherPath("Title"), kPathStatusReadable));
  EXPECT_TRUE(proxy->QueryPathStatus(ovratest::TestPath("Title"), kPathStatusWritable));
}

TEST_F(DisjointProxy, RebuildsWhenARoutedProviderChanges) {
  CallCounter counter;
  proxy->NotifyWhenMetaDataChanged(counter.callback);
  const std::string text = ovratest::PacketText("<pu:Title>reloaded</pu:Title>");
  routed->ResetBuffer(reinterpret_cast<const unsigned char*>(text.data()), text.size());
  EXPECT_EQ(*counter.calls, 1);
  EXPECT_EQ(ovratest::Text(proxy->MetaDataAccess(), ovratest::OtherPath("Title")), "reloaded");
}

TEST_F(DisjointProxy, ASecondSchemaObjectMakesASecondRouteAndTheFirstInOrderWins) {
  auto twin = boost::make_shared<SchemaDefinition>(*otherSchema);
  auto second = RecordingBufferProvider::FromProperties("<pu:Title>second</pu:Title>");
  proxy->RegisterProvider(twin, second);
  const bool originalFirst =
      boost::owner_less<boost::shared_ptr<SchemaDefinition>>()(otherSchema, twin);
  Edit(ovratest::OtherPath("Title"), "winner");
  RecordingBufferProvider& winner = originalFirst ? *routed : *second;
  RecordingBufferProvider& loser = originalFirst ? *second : *routed;
  ASSERT_EQ(winner.writes.size(), 1u);
  EXPECT_EQ(WrittenRaw(winner.writes[0], ovratest::kOtherNS, "Title"), "winner");
  // The other route was opened but got no path: its guard wrote nothing.
  EXPECT_TRUE(loser.writes.empty());
}

TEST_F(DisjointProxy, ReRegisteringASchemaObjectReplacesItsRoute) {
  auto replacement = RecordingBufferProvider::FromProperties("<pu:Title>replacement</pu:Title>");
  proxy->RegisterProvider(otherSchema, replacement);
  Edit(ovratest::OtherPath("Title"), "to replacement");
  EXPECT_TRUE(routed->writes.empty());
  EXPECT_EQ(replacement->writes.size(), 1u);
}

TEST(DisjointSchemaProxyProvider, WithoutProvidersThereIsNoMetadata) {
  DisjointSchemaProxyProvider proxy;
  EXPECT_EQ(proxy.MetaDataAccess(), nullptr);
  proxy.RegisterBaseProvider(boost::shared_ptr<MetaDataProvider>());
  proxy.RegisterProvider(boost::shared_ptr<SchemaDefinition>(),
                         RecordingBufferProvider::FromProperties(""));
  EXPECT_EQ(proxy.MetaDataAccess(), nullptr);
  EXPECT_TRUE(proxy.QueryPathStatus(ovratest::TestPath("Title"), kPathStatusWritable));
  DisableXMPWriting(true);
  EXPECT_FALSE(proxy.QueryPathStatus(ovratest::TestPath("Title"), kPathStatusWritable));
  DisableXMPWriting(false);
}

TEST(DisjointSchemaProxyProvider, RoutesWithoutBaseMakeAFreshPacketAndClearingEmptiesIt) {
  auto routed = RecordingBufferProvider::FromProperties("<pu:Title>only</pu:Title>");
  DisjointSchemaProxyProvider proxy;
  proxy.RegisterProvider(NamespaceDefinition(ovratest::kOtherNS), routed);
  ASSERT_NE(proxy.MetaDataAccess(), nullptr);
  EXPECT_NE(proxy.MetaDataAccess(), routed->MetaDataAccess());
  EXPECT_EQ(ovratest::Text(proxy.MetaDataAccess(), ovratest::OtherPath("Title")), "only");
  proxy.ClearProviders();
  EXPECT_EQ(proxy.MetaDataAccess(), nullptr);
}

}  // namespace
