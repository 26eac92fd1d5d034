#include "ToolkitOutput.h"

#include <algorithm>
#include <iostream>
#include <streambuf>

namespace ovraxmp {
namespace detail {
namespace {

thread_local std::string* tCollected = nullptr;

// Forwards to the stream buffer std::cerr had, unless this thread collects.
class CollectingBuffer : public std::streambuf {
 public:
  std::streambuf* original = nullptr;

 protected:
  std::streamsize xsputn(const char* text, std::streamsize count) override {
    if (tCollected) {
      tCollected->append(text, static_cast<std::size_t>(count));
      return count;
    }
    return original ? original->sputn(text, count) : count;
  }
  int_type overflow(int_type c) override {
    if (traits_type::eq_int_type(c, traits_type::eof())) return traits_type::not_eof(c);
    const char ch = traits_type::to_char_type(c);
    return xsputn(&ch, 1) == 1 ? c : traits_type::eof();
  }
  int sync() override { return tCollected || !original ? 0 : original->pubsync(); }
};

CollectingBuffer sBuffer;

}  // namespace

void StartCollectingToolkitOutput() {
  if (std::cerr.rdbuf() == &sBuffer) return;
  sBuffer.original = std::cerr.rdbuf();
  std::cerr.rdbuf(&sBuffer);
}

void StopCollectingToolkitOutput() {
  // A host that replaced the buffer since keeps its own.
  if (std::cerr.rdbuf() == &sBuffer) std::cerr.rdbuf(sBuffer.original);
}

ToolkitOutput::ToolkitOutput() : mOuter(tCollected) { tCollected = &mText; }

ToolkitOutput::~ToolkitOutput() {
  tCollected = mOuter;
  if (mOuter) mOuter->append(mText);
}

std::vector<std::string> ToolkitOutput::Lines() const {
  std::vector<std::string> lines;
  std::size_t start = 0;
  while (start < mText.size()) {
    std::size_t end = mText.find('\n', start);
    if (end == std::string::npos) end = mText.size();
    std::string line = mText.substr(start, end - start);
    line.erase(0, line.find_first_not_of(" \t\r"));
    line.erase(line.find_last_not_of(" \t\r") + 1);
    if (!line.empty() && std::find(lines.begin(), lines.end(), line) == lines.end()) lines.push_back(line);
    start = end + 1;
  }
  return lines;
}

}  // namespace detail
}  // namespace ovraxmp
