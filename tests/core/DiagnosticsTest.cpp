#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <ovracore/Diagnostics.h>
#include <ovracore/Resources.h>
#include <ovracore/SharedFunctions.h>

using namespace ovracore;

namespace {
const unsigned char kSchemaBytes[] = {'<', 'a', '/', '>', 0};
const unsigned char kViewBytes[] = {'<', 'v', '/', '>', 0};
const unsigned char kNote[] = {'n', 0};
const EmbeddedResource kTable[] = {
    {"dc_definitions", "xml", kSchemaBytes, 4},
    {"readme", "txt", kNote, 1},
    {"views", "xml", kViewBytes, 4},
    {nullptr, nullptr, nullptr, 0},
    {"after_end", "xml", kNote, 1},
};
}  // namespace

TEST(ResourceTable, ListsAndReadsByNameAndType) {
  const ResourceTable table(kTable);
  EXPECT_EQ(table.List("xml"), (std::vector<UTF8String>{"dc_definitions", "views"}));
  EXPECT_EQ(table.List("txt"), (std::vector<UTF8String>{"readme"}));
  EXPECT_TRUE(table.List("XML").empty());
  ASSERT_TRUE(table.Read("views", "xml"));
  EXPECT_EQ(*table.Read("views", "xml"), "<v/>");
  EXPECT_FALSE(table.Read("readme", "xml"));
  EXPECT_FALSE(table.Read("after_end", "xml"));
  EXPECT_TRUE(ResourceTable(nullptr).List("xml").empty());
}

TEST(DebugDatabase, SetGetDefaultAndClearFromManyThreads) {
  EXPECT_EQ(GetDebugValue("ForceMetadataWritable", "false"), "false");
  SetDebugValue("ForceMetadataWritable", "true");
  EXPECT_EQ(GetDebugValue("ForceMetadataWritable", "false"), "true");
  ClearDebugValue("ForceMetadataWritable");
  EXPECT_EQ(GetDebugValue("ForceMetadataWritable"), "");

  std::vector<std::thread> threads;
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([t] {
      for (int i = 0; i < 200; ++i) SetDebugValue("key" + std::to_string(t), std::to_string(i));
    });
  }
  for (std::thread& t : threads) t.join();
  for (int t = 0; t < 8; ++t) EXPECT_EQ(GetDebugValue("key" + std::to_string(t)), "199");
}

TEST(Assertions, ReporterCanBeReplacedRestoredAndSwitchedOff) {
  std::vector<AssertionInfo> seen;
  SetAssertionReporter([&seen](const AssertionInfo& info) { seen.push_back(info); });
  RaiseAssertion({"false", "src/Initialize", "SendError", "could not format"});
  ASSERT_EQ(seen.size(), 1u);
  EXPECT_EQ(seen[0].source, "src/Initialize");
  SetAssertionsEnabled(false);
  EXPECT_FALSE(AssertionsEnabled());
  RaiseAssertion({"x", "y", "z", ""});
  EXPECT_EQ(seen.size(), 1u);
  SetAssertionsEnabled(true);

  SetAssertionReporter({});
  testing::internal::CaptureStderr();
  RaiseAssertion({"a > b", "core/x.cpp", "Check", "went wrong"});
  const std::string line = testing::internal::GetCapturedStderr();
  EXPECT_NE(line.find("a > b"), std::string::npos);
  EXPECT_NE(line.find("went wrong"), std::string::npos);
  EXPECT_EQ(line.find('\n'), line.size() - 1);  // exactly one line
}

TEST(TimeMarks, KeptInOrderWithGrowingElapsedTime) {
  ClearTimeMarks();
  LogTimeMark("StartupTime", "Start Initializing ovrametadata");
  std::this_thread::sleep_for(std::chrono::milliseconds(2));
  LogTimeMark("StartupTime", "Finish Initializing ovrametadata");
  const std::vector<TimeMark> marks = TimeMarks();
  ASSERT_EQ(marks.size(), 2u);
  EXPECT_EQ(marks[0].elapsed.count(), 0);
  EXPECT_EQ(marks[1].text, "Finish Initializing ovrametadata");
  EXPECT_GE(marks[1].elapsed, std::chrono::milliseconds(2));
  ClearTimeMarks();
  EXPECT_TRUE(TimeMarks().empty());
}

TEST(SuiteClient, DefaultAndHostName) {
  EXPECT_EQ(SuiteClientName(), "ovrametadata");
  SetSuiteClientName("Host App");
  EXPECT_EQ(SuiteClientName(), "Host App");
  SetSuiteClientName("");
  EXPECT_EQ(SuiteClientName(), "ovrametadata");
}

TEST(SharedFunctionsList, EmptiedCallablesAreSkippedAndPurged) {
  using Fn = std::shared_ptr<std::function<void(int)>>;
  SharedFunctions<Fn> list;
  std::vector<int> calls;
  Fn first = std::make_shared<std::function<void(int)>>([&calls](int v) { calls.push_back(v); });
  Fn second = std::make_shared<std::function<void(int)>>([&calls](int v) { calls.push_back(v * 10); });
  list.Add(first);
  list.Add(second);
  *first = nullptr;  // withdrawn by the client
  list.CallAll(2);
  EXPECT_EQ(calls, (std::vector<int>{20}));
  EXPECT_EQ(list.Size(), 2u);
  list.Add(std::make_shared<std::function<void(int)>>());
  EXPECT_EQ(list.Size(), 2u);  // the withdrawn entry went on registration
  list.DeleteEmptyFunctions();
  EXPECT_EQ(list.Size(), 1u);
}
