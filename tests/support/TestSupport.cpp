#include "TestSupport.h"

#include <atomic>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace ovratest {

namespace fs = std::filesystem;

TempDir::TempDir() {
  static std::atomic<int> counter{0};
  mPath = TestRoot() / ("t" + std::to_string(counter++));
  fs::create_directories(mPath);
}

TempDir::~TempDir() {
  std::error_code ec;
  fs::remove_all(mPath, ec);
}

ScopedEnv::ScopedEnv(const char* name, const char* value) : mName(name) {
  if (const char* old = std::getenv(name)) mOld = old;
  if (value) {
    setenv(name, value, 1);
  } else {
    unsetenv(name);
  }
}

ScopedEnv::~ScopedEnv() {
  if (mOld) {
    setenv(mName, mOld->c_str(), 1);
  } else {
    unsetenv(mName);
  }
}

std::string ReadFile(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) throw std::runtime_error("cannot read " + path.string());
  std::ostringstream s;
  s << in.rdbuf();
  return s.str();
}

void WriteFile(const fs::path& path, const std::string& contents) {
  fs::create_directories(path.parent_path());
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  if (!out) throw std::runtime_error("cannot write " + path.string());
  out << contents;
}

fs::path DataDir() { return fs::path(OVRA_TEST_DATA_DIR_FALLBACK); }

}  // namespace ovratest
