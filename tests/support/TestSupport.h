// Helpers shared by every test program.
#pragma once

#include <filesystem>
#include <optional>
#include <string>

namespace ovratest {

// A fresh folder below the test run's private temporary root, removed with
// its contents when the object goes away.
class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;
  const std::filesystem::path& path() const { return mPath; }
  std::filesystem::path operator/(const std::string& name) const { return mPath / name; }

 private:
  std::filesystem::path mPath;
};

// Sets (or, for null, unsets) an environment variable for one scope.
class ScopedEnv {
 public:
  ScopedEnv(const char* name, const char* value);
  ~ScopedEnv();
  ScopedEnv(const ScopedEnv&) = delete;
  ScopedEnv& operator=(const ScopedEnv&) = delete;

 private:
  const char* mName;
  std::optional<std::string> mOld;
};

// The temporary root of this test process (its user and local data roots
// live below it).
const std::filesystem::path& TestRoot();

std::string ReadFile(const std::filesystem::path& path);
void WriteFile(const std::filesystem::path& path, const std::string& contents);
// The folder of checked-in test inputs (tests/data).
std::filesystem::path DataDir();

}  // namespace ovratest
