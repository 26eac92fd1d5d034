// The tool's per-file runner: results come back in file order whatever
// order the threads finish in, failures surface in turn, and workers stay
// within their window.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "../../tools/ovrameta/Parallel.h"

namespace {

using ovrameta::ForEachInOrder;

TEST(ForEachInOrder, HandsResultsBackInFileOrderWhileFilesRunSideBySide) {
  constexpr std::size_t kCount = 6;
  std::mutex mutex;
  std::condition_variable lastDone;
  bool last = false;
  std::vector<int> results(kCount, -1);
  std::vector<std::size_t> order;
  bool firstWaited = false;
  ForEachInOrder(
      kCount, 2,
      [&](std::size_t i) {
        if (i == 0) {
          // The first file finishes only after the last one: a second
          // thread must have done all the others meanwhile.
          std::unique_lock<std::mutex> lock(mutex);
          firstWaited = lastDone.wait_for(lock, std::chrono::seconds(30), [&] { return last; });
        }
        results[i] = static_cast<int>(i * i);
        if (i == kCount - 1) {
          std::lock_guard<std::mutex> lock(mutex);
          last = true;
          lastDone.notify_all();
        }
      },
      [&](std::size_t i) {
        EXPECT_EQ(results[i], static_cast<int>(i * i));
        order.push_back(i);
      });
  EXPECT_TRUE(firstWaited);
  EXPECT_EQ(order, (std::vector<std::size_t>{0, 1, 2, 3, 4, 5}));
}

TEST(ForEachInOrder, OneJobRunsEverythingOnTheCallingThreadInTurn) {
  std::vector<std::string> steps;
  const auto caller = std::this_thread::get_id();
  for (const std::size_t count : {std::size_t(0), std::size_t(3)}) {
    steps.clear();
    ForEachInOrder(
        count, 1,
        [&](std::size_t i) {
          EXPECT_EQ(std::this_thread::get_id(), caller);
          steps.push_back("work " + std::to_string(i));
        },
        [&](std::size_t i) { steps.push_back("done " + std::to_string(i)); });
    EXPECT_EQ(steps.size(), count * 2);
  }
  EXPECT_EQ(steps, (std::vector<std::string>{"work 0", "done 0", "work 1", "done 1", "work 2",
                                             "done 2"}));
}

TEST(ForEachInOrder, AFailureSurfacesInItsTurnAfterTheFilesBeforeIt) {
  for (const unsigned jobs : {1u, 3u}) {
    SCOPED_TRACE(jobs);
    std::vector<std::size_t> done;
    EXPECT_THROW(ForEachInOrder(
                     40, jobs,
                     [&](std::size_t i) {
                       if (i == 5) throw std::runtime_error("file 5");
                     },
                     [&](std::size_t i) { done.push_back(i); }),
                 std::runtime_error);
    EXPECT_EQ(done, (std::vector<std::size_t>{0, 1, 2, 3, 4}));
  }
}

TEST(ForEachInOrder, WorkersStayWithinAWindowOfTheConsumer) {
  constexpr std::size_t kCount = 2000;
  std::atomic<std::size_t> started{0};
  std::size_t consumed = 0, furthestAhead = 0;
  ForEachInOrder(
      kCount, 4, [&](std::size_t) { ++started; },
      [&](std::size_t) {
        ++consumed;
        furthestAhead = std::max(furthestAhead, started.load() - consumed);
        // A slow consumer: the workers must wait for it, not run away.
        if (consumed % 100 == 0) std::this_thread::yield();
      });
  EXPECT_EQ(started.load(), kCount);
  EXPECT_EQ(consumed, kCount);
  EXPECT_LE(furthestAhead, 32u * 4u + 4u);
}

}  // namespace
