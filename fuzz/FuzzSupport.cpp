#include "FuzzSupport.h"

#include <unistd.h>

#include <cstdlib>
#include <filesystem>

#include <ovrametadata/Initialize.h>

namespace ovrafuzz {

const std::string& ScratchFolder() {
  // Never destroyed: the exit handler that removes the folder runs after
  // the static destructors.
  static const std::string* const folder = [] {
    const std::filesystem::path path =
        std::filesystem::temp_directory_path() / ("ovra-fuzz-" + std::to_string(::getpid()));
    std::filesystem::create_directories(path / "user");
    std::filesystem::create_directories(path / "local");
    auto* text = new std::string(path.string());
    std::atexit([] {
      std::error_code ec;
      std::filesystem::remove_all(ScratchFolder(), ec);
    });
    return text;
  }();
  return *folder;
}

void StartLibrary() {
  static const bool started = [] {
    setenv("OVRAMETADATA_USER_ROOT", (ScratchFolder() + "/user").c_str(), 1);
    setenv("OVRAMETADATA_LOCAL_ROOT", (ScratchFolder() + "/local").c_str(), 1);
    ovrametadata::Initialize();
    return true;
  }();
  (void)started;
}

}  // namespace ovrafuzz
