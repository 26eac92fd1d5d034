// Helpers of the tool tests: the built ovrameta run in a temporary folder on
// copies of the samples and test media, and ExifTool and ffmpeg as readers
// that owe nothing to the library.
#pragma once

#include <sys/wait.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <initializer_list>
#include <map>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "../xmp/XMPMediaFiles.h"
#include "TestSupport.h"

#ifndef OVRAMETA_EXE
#error "OVRAMETA_EXE must name the built ovrameta program"
#endif
#ifndef OVRA_SAMPLES_DIR
#error "OVRA_SAMPLES_DIR must name the samples folder"
#endif

namespace ovratest {
namespace tool {

namespace fs = std::filesystem;
using ovratest::ReadFile;
using ovratest::TempDir;
using ovratest::WriteFile;
using xmptest::media::ExifToolValue;
using xmptest::media::HaveExifTool;
using xmptest::media::RunCommand;

struct Result {
  int status = -1;
  std::string out;
  std::string err;
};

inline std::string Quote(const std::string& text) {
  std::string quoted = "'";
  for (char c : text) quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
  return quoted + "'";
}

// Every needle is in the text.
inline void ExpectContains(const std::string& text, std::initializer_list<std::string> needles) {
  for (const auto& needle : needles)
    EXPECT_NE(text.find(needle), std::string::npos) << "missing: " << needle << "\nin:\n" << text;
}

inline bool HaveFFmpeg() {
  static const bool have = std::system("ffmpeg -version >/dev/null 2>&1") == 0;
  return have;
}

// What ExifTool reads from each file: tag ("Group:Name") to value, as
// `exiftool -j -a -G1 -struct` gives them, in one run for all files.
inline std::vector<nlohmann::json> ExifToolTags(const std::vector<fs::path>& files) {
  std::string command = "LC_ALL=C exiftool -q -j -a -G1 -struct";
  for (const fs::path& file : files) command += " " + Quote(file.string());
  const nlohmann::json all = nlohmann::json::parse(RunCommand(command + " 2>/dev/null"), nullptr, false);
  std::vector<nlohmann::json> tags(files.size());
  if (all.is_array() && all.size() == files.size()) {
    for (std::size_t i = 0; i < files.size(); ++i) tags[i] = all[i];
  }
  return tags;
}

// The checksums of every decoded frame or audio packet, as ffmpeg makes
// them; the same before and after a write that kept the media intact.
inline std::string DecodedDigest(const fs::path& file) {
  return RunCommand("ffmpeg -v error -i " + Quote(file.string()) + " -map 0 -f framemd5 - 2>&1");
}

// Tags every write may change: the edit history the library records, the
// file system's view, and what ExifTool derives from the size or layout of
// the file (composite values are computed from tags compared one by one).
inline bool Volatile(const std::string& tag) {
  static const std::set<std::string> kTags = {
      "System:FileModifyDate", "System:FileAccessDate", "System:FileInodeChangeDate", "System:FileSize",
      "XMP-xmpMM:History",     "XMP-xmpMM:InstanceID",  "XMP-xmpMM:DocumentID",       "XMP-xmpMM:OriginalDocumentID",
      "XMP-xmp:MetadataDate",  "File:ID3Size",          "QuickTime:MediaDataOffset",  "XMP-xmpNote:HasExtendedXMP"};
  return kTags.count(tag) != 0 || tag.rfind("Composite:", 0) == 0;
}

// Expects every tag of after to be as in before, except the volatile ones
// and those in changed (tag -> value after; "" when gone).
inline void ExpectOnlyChanged(const nlohmann::json& before, const nlohmann::json& after,
                              const std::map<std::string, std::string>& changed, const std::string& file) {
  ASSERT_TRUE(before.is_object() && after.is_object()) << file << ": ExifTool read nothing";
  const auto text = [](const nlohmann::json& tags, const std::string& tag) {
    if (!tags.contains(tag)) return std::string();
    return tags[tag].is_string() ? tags[tag].get<std::string>() : tags[tag].dump();
  };
  std::set<std::string> tags;
  for (const auto& item : before.items()) tags.insert(item.key());
  for (const auto& item : after.items()) tags.insert(item.key());
  for (const std::string& tag : tags) {
    if (Volatile(tag) || tag == "SourceFile") continue;
    const auto asked = changed.find(tag);
    if (asked != changed.end()) {
      EXPECT_EQ(text(after, tag), asked->second) << file << " " << tag;
    } else {
      EXPECT_EQ(text(after, tag), text(before, tag)) << file << " " << tag << " changed";
    }
  }
}

class ToolTest : public ::testing::Test {
 protected:
  // A private copy of a sample (samples/) or of a test medium
  // (tests/data/media/), under a new name when asked.
  fs::path Sample(const std::string& name, const std::string& copyName = std::string()) {
    return CopyIn(fs::path(OVRA_SAMPLES_DIR) / name, copyName.empty() ? name : copyName);
  }
  fs::path Medium(const std::string& name) { return CopyIn(DataDir() / "media" / name, name); }
  fs::path CopyIn(const fs::path& source, const std::string& name) {
    const fs::path target = mDir / name;
    fs::copy_file(source, target, fs::copy_options::overwrite_existing);
    fs::permissions(target, fs::perms::owner_read | fs::perms::owner_write, fs::perm_options::add);
    return target;
  }

  std::string Command(const std::vector<std::string>& arguments) {
    std::string command = Quote(OVRAMETA_EXE);
    for (const auto& argument : arguments) command += " " + Quote(argument);
    return command;
  }
  // Runs ovrameta in the temporary folder with the given arguments, after
  // the shell words in prefix (environment settings, limits).
  Result Run(const std::vector<std::string>& arguments, const std::string& prefix = std::string()) {
    const fs::path out = mDir / ".out", err = mDir / ".err";
    const int raw = std::system(("cd " + Quote(mDir.path().string()) + " && " + prefix + " " + Command(arguments) +
                                 " >" + Quote(out.string()) + " 2>" + Quote(err.string()) + " </dev/null")
                                    .c_str());
    Result result{WIFEXITED(raw) ? WEXITSTATUS(raw) : -1, ReadFile(out), ReadFile(err)};
    fs::remove(out);
    fs::remove(err);
    return result;
  }

  // The display value of one property of one file; empty when absent.
  std::string Get(const fs::path& file, const std::string& name) {
    Result result = Run({"get", file.filename().string(), name});
    while (!result.out.empty() && result.out.back() == '\n') result.out.pop_back();
    return result.status == 0 ? result.out : std::string();
  }
  // Each {file, name, display value}.
  void ExpectValues(const std::vector<std::array<std::string, 3>>& values) {
    for (const auto& [file, name, value] : values) EXPECT_EQ(Get(file, name), value) << file << " " << name;
  }

  TempDir mDir;
};

}  // namespace tool
}  // namespace ovratest
