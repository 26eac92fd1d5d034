#include "Progress.h"

#include <cstdio>
#include <iostream>

#include <sys/ioctl.h>
#include <unistd.h>

namespace ovrameta {

namespace {

int TerminalWidth() {
  winsize size{};
  if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 20) return size.ws_col;
  return 80;
}

}  // namespace

Progress::Progress(std::size_t total, std::string what)
    : mTotal(total),
      mWhat(std::move(what)),
      // The bar is drawn on standard error: results sent to a file or a
      // pipe leave it on the terminal.
      mEnabled(total >= kMinimumFiles && isatty(STDERR_FILENO)) {}

Progress::~Progress() { Clear(); }

void Progress::Step() {
  if (!mEnabled) return;
  ++mDone;
  const auto now = std::chrono::steady_clock::now();
  // Redrawing on every file would cost more than the work on small files.
  if (mDone < mTotal && mDrawn && now - mLastDraw < std::chrono::milliseconds(80)) return;
  mLastDraw = now;
  Draw();
}

void Progress::Draw() {
  // Results written since the last Clear go out first, on their own lines.
  std::cout.flush();
  const std::string counter =
      " " + std::to_string(mDone) + "/" + std::to_string(mTotal) + " " + mWhat;
  int width = TerminalWidth() - static_cast<int>(counter.size()) - 3;
  if (width < 10) width = 10;
  if (width > 50) width = 50;
  const int filled = mTotal ? static_cast<int>(mDone * width / mTotal) : width;
  std::string bar = "\r[";
  bar.append(static_cast<std::size_t>(filled), '#');
  bar.append(static_cast<std::size_t>(width - filled), ' ');
  bar += "]" + counter;
  std::fputs(bar.c_str(), stderr);
  std::fflush(stderr);
  mDrawn = true;
}

void Progress::Clear() {
  if (!mDrawn) return;
  // Carriage return, erase the line.
  std::fputs("\r\033[K", stderr);
  std::fflush(stderr);
  mDrawn = false;
}

}  // namespace ovrameta
