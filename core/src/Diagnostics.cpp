#include <ovracore/Diagnostics.h>

#include <atomic>
#include <csignal>
#include <cstdio>
#include <fstream>
#include <map>
#include <mutex>
#include <optional>
#include <string>

namespace ovracore {

namespace {

struct DebugDatabase {
  std::mutex mutex;
  std::map<std::string, std::string, std::less<>> values;
};

DebugDatabase& sDebugDatabase() {
  static DebugDatabase database;
  return database;
}

struct AssertionState {
  std::mutex mutex;
  AssertionReporter reporter;
  std::atomic<bool> enabled{true};
};

AssertionState& sAssertions() {
  static AssertionState state;
  return state;
}

struct TimeLog {
  std::mutex mutex;
  std::optional<std::chrono::steady_clock::time_point> start;
  std::vector<TimeMark> marks;
};

TimeLog& sTimeLog() {
  static TimeLog log;
  return log;
}

struct ClientName {
  std::mutex mutex;
  UTF8String name = "ovrametadata";
};

ClientName& sClientName() {
  static ClientName name;
  return name;
}

void DefaultReporter(const AssertionInfo& info) {
  std::fprintf(stderr, "ovracore assertion failed: %s in %s (%s)%s%s\n", info.condition.c_str(),
               info.function.c_str(), info.source.c_str(), info.message.empty() ? "" : ": ",
               info.message.c_str());
  std::fflush(stderr);
}

bool DebuggerAttached() {
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.compare(0, 10, "TracerPid:") == 0) return std::stol(line.substr(10)) != 0;
  }
  return false;
}

}  // namespace

void SetDebugValue(std::string_view key, std::string_view value) {
  DebugDatabase& db = sDebugDatabase();
  std::lock_guard<std::mutex> lock(db.mutex);
  db.values[std::string(key)] = std::string(value);
}

UTF8String GetDebugValue(std::string_view key, std::string_view defaultValue) {
  DebugDatabase& db = sDebugDatabase();
  std::lock_guard<std::mutex> lock(db.mutex);
  const auto it = db.values.find(key);
  return it == db.values.end() ? UTF8String(defaultValue) : it->second;
}

void ClearDebugValue(std::string_view key) {
  DebugDatabase& db = sDebugDatabase();
  std::lock_guard<std::mutex> lock(db.mutex);
  const auto it = db.values.find(key);
  if (it != db.values.end()) db.values.erase(it);
}

void SetAssertionReporter(AssertionReporter reporter) {
  AssertionState& state = sAssertions();
  std::lock_guard<std::mutex> lock(state.mutex);
  state.reporter = std::move(reporter);
}

void SetAssertionsEnabled(bool enabled) { sAssertions().enabled.store(enabled); }

bool AssertionsEnabled() { return sAssertions().enabled.load(); }

void RaiseAssertion(const AssertionInfo& info) {
  AssertionState& state = sAssertions();
  if (!state.enabled.load()) return;
  AssertionReporter reporter;
  {
    std::lock_guard<std::mutex> lock(state.mutex);
    reporter = state.reporter;
  }
  // Called outside the lock so that a reporter may itself change the settings.
  if (reporter) {
    reporter(info);
  } else {
    DefaultReporter(info);
  }
  if (GetDebugValue("BreakOnAssertion") == "true" && DebuggerAttached()) std::raise(SIGTRAP);
}

void LogTimeMark(std::string_view category, std::string_view text) {
  const auto now = std::chrono::steady_clock::now();
  TimeLog& log = sTimeLog();
  std::lock_guard<std::mutex> lock(log.mutex);
  if (!log.start) log.start = now;
  log.marks.push_back(TimeMark{UTF8String(category), UTF8String(text),
                               std::chrono::duration_cast<std::chrono::microseconds>(now - *log.start)});
}

std::vector<TimeMark> TimeMarks() {
  TimeLog& log = sTimeLog();
  std::lock_guard<std::mutex> lock(log.mutex);
  return log.marks;
}

void ClearTimeMarks() {
  TimeLog& log = sTimeLog();
  std::lock_guard<std::mutex> lock(log.mutex);
  log.marks.clear();
  log.start.reset();
}

UTF8String SuiteClientName() {
  ClientName& client = sClientName();
  std::lock_guard<std::mutex> lock(client.mutex);
  return client.name;
}

void SetSuiteClientName(std::string_view name) {
  ClientName& client = sClientName();
  std::lock_guard<std::mutex> lock(client.mutex);
  client.name = name.empty() ? UTF8String("ovrametadata") : UTF8String(name);
}

}  // namespace ovracore
