#include <atomic>
#include <set>
#include <thread>

#include "SrcTestSupport.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;
using ovratest::U8;

namespace {

TEST(ErrorReporting, PlainErrorKeepsTheMessageAsItStands) {
  ErrorsSince since;
  SendError(kPlainError, u"abc", u"");
  // Text that looks like a key or a placeholder is not interpreted.
  SendError(kPlainError, u"$$$/ovrametadata/x=y @0 #{quot}", u"");
  const auto errors = since.New();
  ASSERT_EQ(errors.size(), 2u);
  ovratest::ExpectError(errors[0], kPlainError, "abc", u"");
  ovratest::ExpectError(errors[1], kPlainError, "$$$/ovrametadata/x=y @0 #{quot}", u"");
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
    ovratest::ExpectError(errors[i], formats[i].first, formats[i].second, u"/tmp/defs.xml");
  }
}

TEST(ErrorReporting, UnknownTypeRecordsAnEmptyText) {
  ErrorsSince since;
  SendError(static_cast<ErrorType>(9), u"lost", u"src");
  const auto errors = since.New();
  ASSERT_EQ(errors.size(), 1u);
  EXPECT_TRUE(errors[0].message.empty());
  EXPECT_EQ(U8(errors[0].source), "src");
}

TEST(ErrorCallbacks, ReceiveTheTextWithoutTheSourceAndMayReadTheList) {
  std::vector<std::u16string> received;
  std::size_t listSizeSeen = 0;
  auto callback = boost::make_shared<ErrorCallback>([&](const std::u16string& text) {
    received.push_back(text);
    // Would deadlock if callbacks ran under the error lock.
    listSizeSeen = GetErrorInfos().size();
  });
  NotifyOnError(callback);
  ErrorsSince since;
  SendError(kDefinitionParsingError, u"x", u"/data/file.xml");
  callback->clear();

  ASSERT_EQ(received.size(), 1u);
  EXPECT_EQ(U8(received[0]), "Error parsing definitions file: x");
  EXPECT_EQ(listSizeSeen, GetErrorInfos().size());
  ASSERT_EQ(since.New().size(), 1u);
  EXPECT_EQ(U8(since.New()[0].source), "/data/file.xml");
}

TEST(ErrorCallbacks, ClearedCallbackIsSkippedAndDroppedOnTheNextRegistration) {
  int firstCalls = 0;
  int secondCalls = 0;
  auto first = boost::make_shared<ErrorCallback>([&](const std::u16string&) { ++firstCalls; });
  auto second = boost::make_shared<ErrorCallback>([&](const std::u16string&) { ++secondCalls; });
  NotifyOnError(first);
  SendError(kPlainError, u"one", u"");
  first->clear();
  SendError(kPlainError, u"two", u"");
  EXPECT_EQ(firstCalls, 1);

  const long heldBefore = first.use_count();
  NotifyOnError(second);
  EXPECT_EQ(first.use_count(), heldBefore - 1) << "the cleared entry is still kept";
  SendError(kPlainError, u"three", u"");
  EXPECT_EQ(firstCalls, 1);
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
