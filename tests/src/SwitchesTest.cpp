#include <ovracore/Diagnostics.h>

#include "MetadataTestSupport.h"

using namespace ovrametadata;

namespace {

TEST(XMPWritingSwitch, CallsBackOnlyOnChangeAndNotClearedCallbacks) {
  ASSERT_FALSE(IsXMPWritingDisabled());
  int firstCalls = 0;
  int calls = 0;
  auto first = boost::make_shared<XMPWritingChangedCallback>([&] { ++firstCalls; });
  auto callback = boost::make_shared<XMPWritingChangedCallback>([&] { ++calls; });
  NotifyWhenXMPWritingChanged(first);
  first->clear();
  NotifyWhenXMPWritingChanged(callback);

  DisableXMPWriting(false);
  EXPECT_EQ(calls, 0);
  DisableXMPWriting(true);
  DisableXMPWriting(true);
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(IsXMPWritingDisabled());
  DisableXMPWriting(false);
  EXPECT_EQ(calls, 2);
  EXPECT_FALSE(IsXMPWritingDisabled());
  EXPECT_EQ(firstCalls, 0);
  callback->clear();
}

TEST(ForcedWritableSwitch, OnlyTheExactWordTrueSwitchesItOn) {
  ovracore::ClearDebugValue("ForceMetadataWritable");
  EXPECT_FALSE(IsAllMetadataForcedWritable());

  ForcedAllMetadataWritable(true);
  EXPECT_EQ(ovracore::GetDebugValue("ForceMetadataWritable"), "true");
  EXPECT_TRUE(IsAllMetadataForcedWritable());
  ForcedAllMetadataWritable(false);
  EXPECT_EQ(ovracore::GetDebugValue("ForceMetadataWritable"), "false");
  EXPECT_FALSE(IsAllMetadataForcedWritable());

  // Set from outside the library, as a debug preference would.
  ovracore::SetDebugValue("ForceMetadataWritable", "TRUE");
  EXPECT_FALSE(IsAllMetadataForcedWritable());
  ovracore::SetDebugValue("ForceMetadataWritable", "true");
  EXPECT_TRUE(IsAllMetadataForcedWritable());
  ovracore::ClearDebugValue("ForceMetadataWritable");
}

}  // namespace
