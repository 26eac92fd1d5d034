// Runs every test with the user and machine data roots pointed at a private
// temporary folder, so that no test reads or writes the real home.
#include <cstdlib>
#include <filesystem>
#include <string>

#include <gtest/gtest.h>
#include <unistd.h>

#include "TestSupport.h"

namespace ovratest {
namespace {
std::filesystem::path& Root() {
  static std::filesystem::path root;
  return root;
}
}  // namespace

const std::filesystem::path& TestRoot() { return Root(); }
}  // namespace ovratest

int main(int argc, char** argv) {
  namespace fs = std::filesystem;
  std::string pattern = (fs::temp_directory_path() / "ovratest-XXXXXX").string();
  if (!mkdtemp(pattern.data())) return 2;
  ovratest::Root() = pattern;
  fs::create_directories(ovratest::Root() / "user");
  fs::create_directories(ovratest::Root() / "local");
  setenv("OVRAMETADATA_USER_ROOT", (ovratest::Root() / "user").c_str(), 1);
  setenv("OVRAMETADATA_LOCAL_ROOT", (ovratest::Root() / "local").c_str(), 1);
  setenv("LC_ALL", "en_US.UTF-8", 1);

  ::testing::InitGoogleTest(&argc, argv);
  const int rc = RUN_ALL_TESTS();
  std::error_code ec;
  fs::remove_all(ovratest::Root(), ec);
  return rc;
}
