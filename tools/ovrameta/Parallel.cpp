#include "Parallel.h"

#include <algorithm>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <thread>
#include <vector>

namespace ovrameta {

namespace {

unsigned gJobs = 0;  // 0: one per core

}  // namespace

void SetJobs(unsigned jobs) { gJobs = std::min(jobs, kMaxJobs); }

unsigned Jobs() {
  if (gJobs != 0) return gJobs;
  const unsigned cores = std::thread::hardware_concurrency();
  return std::clamp(cores, 1u, kMaxJobs);
}

void ForEachInOrder(std::size_t count, unsigned jobs, const std::function<void(std::size_t)>& work,
                    const std::function<void(std::size_t)>& done) {
  const std::size_t threads = std::min<std::size_t>(std::max(jobs, 1u), count);
  if (threads <= 1) {
    for (std::size_t i = 0; i < count; ++i) {
      work(i);
      done(i);
    }
    return;
  }

  std::mutex mutex;
  std::condition_variable changed;
  std::vector<char> finished(count, 0);
  std::vector<std::exception_ptr> failures(count);
  std::size_t next = 0;      // the next file to hand out
  std::size_t consumed = 0;  // files that done has seen
  bool stop = false;
  const std::size_t window = 32 * threads;

  const auto worker = [&] {
    for (;;) {
      std::size_t i = 0;
      {
        std::unique_lock<std::mutex> lock(mutex);
        changed.wait(lock, [&] { return stop || next >= count || next < consumed + window; });
        if (stop || next >= count) return;
        i = next++;
      }
      std::exception_ptr failure;
      try {
        work(i);
      } catch (...) {
        failure = std::current_exception();
      }
      {
        std::lock_guard<std::mutex> lock(mutex);
        finished[i] = 1;
        failures[i] = failure;
      }
      changed.notify_all();
    }
  };

  std::vector<std::thread> pool;
  const auto stopAll = [&] {
    {
      std::lock_guard<std::mutex> lock(mutex);
      stop = true;
    }
    changed.notify_all();
    for (std::thread& thread : pool) thread.join();
    pool.clear();
  };
  try {
    for (std::size_t t = 0; t < threads; ++t) pool.emplace_back(worker);
    for (std::size_t i = 0; i < count; ++i) {
      {
        std::unique_lock<std::mutex> lock(mutex);
        changed.wait(lock, [&] { return finished[i] != 0; });
      }
      if (failures[i]) std::rethrow_exception(failures[i]);
      done(i);
      {
        std::lock_guard<std::mutex> lock(mutex);
        consumed = i + 1;
      }
      changed.notify_all();
    }
  } catch (...) {
    stopAll();
    throw;
  }
  stopAll();
}

}  // namespace ovrameta
