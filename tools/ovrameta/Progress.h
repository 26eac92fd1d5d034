// Private to the ovrameta tool (not part of the library's interface): a
// progress bar for long runs, drawn on the terminal only.
#pragma once

#include <chrono>
#include <string>

namespace ovrameta {

class Progress {
 public:
  // Draws nothing unless standard error is a terminal and there are at
  // least kMinimumFiles steps.
  Progress(std::size_t total, std::string what);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  void Step();
  // Erases the bar so that messages and results start on a clean line.
  void Clear();

  static constexpr std::size_t kMinimumFiles = 20;

 private:
  void Draw();

  std::size_t mTotal;
  std::size_t mDone = 0;
  std::string mWhat;
  bool mEnabled;
  bool mDrawn = false;
  std::chrono::steady_clock::time_point mLastDraw;
};

}  // namespace ovrameta
