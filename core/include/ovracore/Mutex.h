// ovracore: the locks the library uses.
#pragma once

#include <mutex>

namespace ovracore {
using Mutex = std::mutex;
using RecursiveMutex = std::recursive_mutex;
template <class M>
using LockGuard = std::lock_guard<M>;
}  // namespace ovracore
