// Not part of the interface: what the toolkit prints. exempi writes the
// text of every error it raises to std::cerr, also for errors it handles
// itself; the layer collects that text per thread while it calls the
// toolkit, so that the library can report it with the file it concerns.
#pragma once

#include <string>
#include <vector>

namespace ovraxmp {
namespace detail {

// Routes std::cerr through the collector while the toolkit is up; the
// host's own writes pass through untouched. Both are called under the
// toolkit's start-up lock.
void StartCollectingToolkitOutput();
void StopCollectingToolkitOutput();

// Collects what the toolkit prints on this thread while it lives.
class ToolkitOutput {
 public:
  ToolkitOutput();
  ~ToolkitOutput();
  ToolkitOutput(const ToolkitOutput&) = delete;
  ToolkitOutput& operator=(const ToolkitOutput&) = delete;
  // The lines printed so far, each once, without blanks around them.
  std::vector<std::string> Lines() const;

 private:
  std::string mText;
  std::string* mOuter;
};

}  // namespace detail
}  // namespace ovraxmp
