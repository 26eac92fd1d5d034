// Start and stop, packet handles and the namespace registry.
#include <string>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;

TEST(XMPStartup, InitializeIsCountedAndTerminateOfExtraHoldsKeepsToolkitUp) {
  ASSERT_TRUE(XMPMeta::Initialize());
  ASSERT_TRUE(XMPFiles::Initialize("/elsewhere"));
  XMPFiles::Terminate();
  XMPMeta::Terminate();
  // The environment still holds one start: the toolkit must still work.
  EXPECT_EQ(XMPMeta::GetNamespacePrefix(kXMP_NS_DC), std::optional<std::string>("dc:"));
  XMPMeta meta;
  EXPECT_NE(meta.GetInternalRef(), nullptr);
}

TEST(XMPPacketHandle, PacketLivesUntilItsLastReference) {
  XMPMetaRef ref = nullptr;
  {
    XMPMeta owner;
    ref = owner.GetInternalRef();
    EXPECT_EQ(XMPMetaRefGetCount(ref), 1);
    XMPMetaRefAddRef(ref);
    XMPMeta second(ref);
    XMPMeta third(second);
    EXPECT_EQ(XMPMetaRefGetCount(ref), 4);
    XMPMeta moved(std::move(third));
    EXPECT_EQ(third.GetInternalRef(), nullptr);
    EXPECT_EQ(XMPMetaRefGetCount(ref), 4);
    XMPMeta other;
    other = second;
    EXPECT_EQ(XMPMetaRefGetCount(ref), 5);
    EXPECT_EQ(other.GetInternalRef(), ref);
  }
  EXPECT_EQ(XMPMetaRefGetCount(ref), 1);
  XMPMetaRefRelease(ref);  // the last one; the sanitizer build checks the free
}

TEST(XMPNamespaces, RegisterAnswersWhetherTheSuggestedPrefixWasGiven) {
  std::string registered;
  EXPECT_TRUE(XMPMeta::RegisterNamespace("http://ovra.test/ns/one/", "ovone", &registered));
  EXPECT_EQ(registered, "ovone:");
  // Registering again with the same prefix (with colon this time) is fine.
  EXPECT_TRUE(XMPMeta::RegisterNamespace("http://ovra.test/ns/one/", "ovone:", &registered));
  EXPECT_EQ(registered, "ovone:");
  // A taken prefix: registered under a generated prefix, answer false.
  EXPECT_FALSE(XMPMeta::RegisterNamespace("http://ovra.test/ns/two/", "ovone", &registered));
  EXPECT_NE(registered, "ovone:");
  EXPECT_EQ(registered.back(), ':');
  EXPECT_EQ(XMPMeta::GetNamespacePrefix("http://ovra.test/ns/two/"), std::optional<std::string>(registered));
  // A namespace that already has another prefix keeps it.
  EXPECT_FALSE(XMPMeta::RegisterNamespace(kXMP_NS_DC, "dublin", &registered));
  EXPECT_EQ(registered, "dc:");
  EXPECT_FALSE(XMPMeta::RegisterNamespace(kXMP_NS_DC, "dublin", nullptr));
}

TEST(XMPNamespaces, BadArgumentsRaiseBadParam) {
  for (const char* prefix : {"", "1abc", "a b", ":"}) {
    EXPECT_EQ(xmptest::ErrorIdOf([&] { XMPMeta::RegisterNamespace("http://ovra.test/ns/bad/", prefix, nullptr); }),
              kXMPErr_BadParam)
        << "prefix \"" << prefix << "\"";
  }
  EXPECT_THROW(XMPMeta::RegisterNamespace("", "ovempty", nullptr), XMP_Error);
}

TEST(XMPNamespaces, LookupsAnswerFalseForUnknown) {
  EXPECT_FALSE(XMPMeta::GetNamespacePrefix("http://ovra.test/never/registered/"));
  EXPECT_EQ(XMPMeta::GetNamespacePrefix(kXMP_NS_Transient), std::optional<std::string>("xmpx:"));
}

TEST(XMPStartup, LastTerminateStopsTheToolkitAndInitializeRestartsIt) {
  ASSERT_TRUE(XMPMeta::RegisterNamespace("http://ovra.test/ns/cycle/", "ovcycle", nullptr));
  XMPMeta survivor;
  survivor.SetProperty(kXMP_NS_XMP, "Label", "kept");
  // Give back the holds of the test environment: the count reaches zero.
  XMPFiles::Terminate();
  XMPMeta::Terminate();
  XMPMeta::Terminate();  // extra calls are ignored
  ASSERT_TRUE(XMPMeta::Initialize());
  ASSERT_TRUE(XMPFiles::Initialize("/nonexistent/plugins"));
  EXPECT_FALSE(XMPMeta::GetNamespacePrefix("http://ovra.test/ns/cycle/"));  // a fresh registry
  EXPECT_TRUE(XMPMeta::GetNamespacePrefix(kXMP_NS_Transient));
  EXPECT_EQ(xmptest::Get(survivor, kXMP_NS_XMP, "Label"), "kept");
}
