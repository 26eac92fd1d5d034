// ovracore: lists of shared callables. A client withdraws a callback by
// emptying the callable it shares; empty entries are skipped when the list is
// called and purged by DeleteEmptyFunctions.
#pragma once

#include <algorithm>
#include <vector>

namespace ovracore {

// FunctionPtr is a shared pointer (boost:: or std::) to a function object.
template <class FunctionPtr>
class SharedFunctions {
 public:
  void Add(const FunctionPtr& fn) {
    DeleteEmptyFunctions();
    mFunctions.push_back(fn);
  }
  void DeleteEmptyFunctions() {
    mFunctions.erase(std::remove_if(mFunctions.begin(), mFunctions.end(),
                                    [](const FunctionPtr& f) { return !f || !*f; }),
                     mFunctions.end());
  }
  // Calls every callable that is still set, in registration order, on a
  // snapshot so that callbacks may change the list while being called.
  template <class... Args>
  void CallAll(Args&&... args) const {
    const std::vector<FunctionPtr> snapshot = mFunctions;
    for (const FunctionPtr& f : snapshot) {
      if (f && *f) {
        auto copy = *f;
        copy(args...);
      }
    }
  }
  void Clear() { mFunctions.clear(); }
  std::size_t Size() const { return mFunctions.size(); }

 private:
  std::vector<FunctionPtr> mFunctions;
};

}  // namespace ovracore
