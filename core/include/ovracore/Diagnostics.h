// ovracore: the debug database, the assertion facility and start-up time marks.
#pragma once

#include <chrono>
#include <functional>
#include <vector>

#include <ovracore/Strings.h>

namespace ovracore {

// The debug database: process-wide string settings, thread-safe.
void SetDebugValue(std::string_view key, std::string_view value);
UTF8String GetDebugValue(std::string_view key, std::string_view defaultValue = {});
void ClearDebugValue(std::string_view key);

// Assertions. The default reporter writes one line to stderr; a host can
// install its own (an empty function restores the default) or switch
// reporting off for the rest of the process.
struct AssertionInfo {
  UTF8String condition;
  UTF8String source;    // file or module that raised it
  UTF8String function;
  UTF8String message;
};
using AssertionReporter = std::function<void(const AssertionInfo&)>;
void SetAssertionReporter(AssertionReporter reporter);
void SetAssertionsEnabled(bool enabled);
bool AssertionsEnabled();
// With the debug value "BreakOnAssertion" set to "true" and a debugger
// attached, an assertion also stops in the debugger.
void RaiseAssertion(const AssertionInfo& info);

// Start-up time marks: category + text + time since the first mark (the
// first mark after ClearTimeMarks starts the clock again).
struct TimeMark {
  UTF8String category;
  UTF8String text;
  std::chrono::microseconds elapsed;
};
void LogTimeMark(std::string_view category, std::string_view text);
std::vector<TimeMark> TimeMarks();
void ClearTimeMarks();

// The client's name as the host configured it ("ovrametadata" by default);
// the toolkit records it as the software agent of saves.
UTF8String SuiteClientName();
void SetSuiteClientName(std::string_view name);  // empty: back to the default

}  // namespace ovracore
