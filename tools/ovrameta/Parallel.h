// Private to the ovrameta tool (not part of the library's interface): the
// per-file work of a command on several threads, with the results handed
// back in the order of the files.
#pragma once

#include <cstddef>
#include <functional>

namespace ovrameta {

// Threads for per-file work: the --jobs option when given, else one per
// core (at most kMaxJobs).
void SetJobs(unsigned jobs);
unsigned Jobs();
constexpr unsigned kMaxJobs = 8;

// Calls work(i) for every i in [0, count) on up to `jobs` threads, and
// done(i) on the calling thread in the order of i, each as soon as work(i)
// has finished. work(i) must only touch what belongs to file i, and use a
// provider from one thread at a time. Workers run at most a window of
// files ahead of done, so that results do not pile up. An exception from
// work(i) is rethrown from this call when its turn comes, after every
// worker has stopped. With one job or one file everything runs on the
// calling thread, one file after the other.
void ForEachInOrder(std::size_t count, unsigned jobs, const std::function<void(std::size_t)>& work,
                    const std::function<void(std::size_t)>& done);

}  // namespace ovrameta
