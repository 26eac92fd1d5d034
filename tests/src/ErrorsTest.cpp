#include <atomic>
#include <set>
#include <thread>

#include "MetadataTestSupport.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;
using ovratest::U8;

namespace {

TEST(ErrorReporting, PlainErrorKeepsTheMessageAsItStands) {
  ErrorsSince since;
  SendError(kPlainError, u"abc", u"");
  // Text that looks like a key or a placeholder is not interpreted.
  SendError(kPlainError, u"$$$/ovrametadata/x=y @0 #{quot}", u"");
  since.Expect(kPlainError, u"", {"abc", "$$$/ovrametadata/x=y @0 #{quot}"});
  EXPECT_TRUE(HasErrors());
}

TEST(ErrorReporting, EveryTypeUsesItsLocalisedFormat) {
  const std::pair<ErrorType, std::string> formats[] = {
      {kDefinitionParsingError, "Error parsing definitions file: x"},
      {kDefinitionRegistrationError, "Error registering definition: x"},
      {kErrorReadingXMP, "Error reading XMP data: x"},
      {kErrorWritingXMP, "Error writing XMP data: x"},
      {kViewDefinitionParsingError, "Error parsing view definitions file: x"},
      {kViewDefinitionRegistrationError, "Error registering view definition: x"},
      {kExtensionManifestParsingError, "Error parsing manifest file: x"},
      {kExtensionPackageRegistrationError, "Error registering extension package: x"},
  };
  ErrorsSince since;
  for (const auto& format : formats) SendError(format.first, u"x", u"/tmp/defs.xml");
  const auto errors = since.New();
  ASSERT_EQ(errors.size(), std::size(formats));
  for (std::size_t i = 0; i < errors.size(); ++i) {
    EXPECT_EQ(errors[i].type, formats[i].first);
    EXPECT_EQ(U8(errors[i].message), formats[i].second);
    EXPECT_EQ(U8(errors[i].source), "/tmp/defs.xml");
  }
}

TEST(ErrorReporting, UnknownTypeRecordsAnEmptyText) {
  ErrorsSince since;
  SendError(static_cast<ErrorType>(9), u"lost", u"src");
  since.Expect(static_cast<ErrorType>(9), u"src", {""});
}

TEST(ErrorCallbacks, ReceiveTheTextMayReadTheListAndStopOnceCleared) {
  std::vector<std::u16string> received;
  std::size_t listSizeSeen = 0;
  int secondCalls = 0;
  auto first = boost::make_shared<ErrorCallback>([&](const std::u16string& text) {
    received.push_back(text);
    // Would deadlock if callbacks ran under the error lock.
    listSizeSeen = GetErrorInfos().size();
  });
  auto second = boost::make_shared<ErrorCallback>([&](const std::u16string&) { ++secondCalls; });
  NotifyOnError(first);
  ErrorsSince since;
  SendError(kDefinitionParsingError, u"x", u"/data/file.xml");
  EXPECT_EQ(listSizeSeen, GetErrorInfos().size());
  since.Expect(kDefinitionParsingError, u"/data/file.xml", {"Error parsing definitions file: x"});
  first->clear();
  SendError(kPlainError, u"two", u"");
  // The callback gets the text without the source.
  EXPECT_EQ(received, std::vector<std::u16string>{u"Error parsing definitions file: x"});

  NotifyOnError(second);
  SendError(kPlainError, u"three", u"");
  EXPECT_EQ(received.size(), 1u);
  EXPECT_EQ(secondCalls, 1);
  second->clear();
}

TEST(ErrorReporting, ConcurrentReportsAreAllRecordedAndNotified) {
  constexpr int kThreads = 8;
  constexpr int kReportsPerThread = 250;
  std::atomic<int> notified{0};
  auto callback =
      boost::make_shared<ErrorCallback>([&](const std::u16string&) { notified.fetch_add(1); });
  NotifyOnError(callback);
  ErrorsSince since;

  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([t] {
      for (int i = 0; i < kReportsPerThread; ++i) {
        SendError(kErrorReadingXMP, ovratest::U16(std::to_string(t) + "/" + std::to_string(i)),
                  u"thread");
      }
    });
  }
  for (auto& thread : threads) thread.join();
  callback->clear();

  const auto errors = since.New();
  ASSERT_EQ(errors.size(), static_cast<std::size_t>(kThreads * kReportsPerThread));
  EXPECT_EQ(notified.load(), kThreads * kReportsPerThread);
  std::set<std::string> distinct;
  for (const auto& error : errors) distinct.insert(U8(error.message));
  EXPECT_EQ(distinct.size(), errors.size());
  EXPECT_EQ(distinct.count("Error reading XMP data: 7/249"), 1u);
}

}  // namespace
