// Writes under faults: a system call that fails once (FaultShim.cpp,
// preloaded into ovrameta), a process killed or stopped mid-write, files
// that may not be written, two writers at once. After each, a file is the
// original byte for byte, or the complete new file that lost nothing.
#include <sys/stat.h>

#include "ToolTestSupport.h"

#ifndef OVRA_FAULT_SHIM
#error "OVRA_FAULT_SHIM must name the preloadable fault library"
#endif

namespace {

using namespace ovratest::tool;

class WriteFault : public ToolTest {
 protected:
  // Runs ovrameta with one fault (see FaultShim.cpp).
  Result RunWithFault(const std::vector<std::string>& arguments, const std::string& fault,
                      const std::string& more = std::string()) {
    return Run(arguments, "OVRA_FAULT=" + Quote(fault) + " OVRA_FAULT_FIRED=" + Quote((mDir / ".fired").string()) +
                              " " + more + " LD_PRELOAD=" + Quote(OVRA_FAULT_SHIM) +
                              " ASAN_OPTIONS=verify_asan_link_order=0:detect_leaks=0");
  }
  bool Fired() {
    const bool fired = fs::exists(mDir / ".fired");
    fs::remove(mDir / ".fired");
    return fired;
  }
  // The hidden new files left in the folder.
  std::vector<std::string> Leftovers() {
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(mDir.path()))
      if (entry.path().filename().string().find(".ovra-") != std::string::npos)
        names.push_back(entry.path().filename().string());
    return names;
  }
};

TEST_F(WriteFault, AReadThatFailedWroteAPacketWithOnlyTheNewValue) {
  if (!HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; writes are not compared";
  const fs::path original = Medium("lang-iptc-digest.jpg");
  const std::string bytes = ReadFile(original);
  // Each read-side call fails once, at each of its first occurrences.
  std::vector<fs::path> written;
  int index = 0;
  for (const std::string call : {"open:EACCES", "open:EMFILE", "pread:EIO", "read:EIO", "lseek:EIO",
                                 "copy_file_range:EIO"}) {
    for (int n = 1; n <= 6; ++n) {
      const std::string name = "run-" + std::to_string(++index) + ".jpg";
      WriteFile(mDir / name, bytes);
      const Result result = RunWithFault({"set", name, "xmp:Label=Blue"}, call + ":" + std::to_string(n) + ":" + name);
      if (!Fired()) break;
      if (result.status != 0) {
        EXPECT_EQ(ReadFile(mDir / name), bytes) << call << " #" << n << ": " << result.err;
        ExpectContains(result.err, {name + ": cannot"});
      } else {
        written.push_back(mDir / name);
      }
    }
  }
  std::vector<fs::path> files = {original};
  files.insert(files.end(), written.begin(), written.end());
  const auto tags = ExifToolTags(files);
  for (std::size_t i = 1; i < files.size(); ++i)
    ExpectOnlyChanged(tags[0], tags[i], {{"XMP-xmp:Label", "Blue"}, {"System:FileName", files[i].filename().string()}},
                      files[i].filename().string());
}

TEST_F(WriteFault, EveryFailureNamesTheFileAndTheReason) {
  const fs::path file = Medium("packet.png");
  const std::string bytes = ReadFile(file);
  const std::string folder = mDir.path().filename().string();
  struct Case {
    std::string fault, more, reason;
  };
  for (const Case& c : {Case{"write:ENOSPC:1:" + folder, "", "No space left on device"},
                        Case{"fsync:EIO:1:" + folder, "", "Input/output error"},
                        Case{"create:EROFS:0:" + folder, "", "Read-only file system"},
                        Case{"rename:MOVE:1:packet.png", "", "Is a directory"}}) {
    const Result result = RunWithFault({"set", "packet.png", "xmp:Label=Blue"}, c.fault, c.more);
    EXPECT_TRUE(Fired()) << c.fault;
    EXPECT_EQ(result.status, 2) << c.fault;
    ExpectContains(result.err, {"packet.png: cannot write file: ", c.reason, "0 files written, 1 not written"});
    if (fs::is_directory(file)) {
      // The original was moved away and a folder took its name.
      fs::remove(file);
      fs::rename(mDir / "packet.png.moved", file);
    }
    EXPECT_EQ(ReadFile(file), bytes) << c.fault;
    EXPECT_TRUE(Leftovers().empty()) << c.fault;
  }
}

TEST_F(WriteFault, AKilledWriteLeftTheOriginalAndTemporaryFilesForever) {
  const fs::path file = Medium("packet.png");
  fs::permissions(file, fs::perms::owner_read | fs::perms::owner_write, fs::perm_options::replace);
  const std::string bytes = ReadFile(file);
  const std::string folder = mDir.path().filename().string();
  // Where the system has no unnamed files, a killed write leaves one
  // hidden file, private like the original; the next write removes it.
  RunWithFault({"set", "packet.png", "xmp:Label=Blue"}, "write:KILL:1:" + folder, "OVRA_FAULT_NO_TMPFILE=1");
  EXPECT_EQ(ReadFile(file), bytes);
  const std::vector<std::string> left = Leftovers();
  ASSERT_EQ(left.size(), 1u);
  EXPECT_EQ(fs::status(mDir / left[0]).permissions() & fs::perms::all,
            fs::perms::owner_read | fs::perms::owner_write);
  EXPECT_EQ(Run({"set", "packet.png", "xmp:Label=Blue"}).status, 0);
  EXPECT_TRUE(Leftovers().empty());
  // Stopped by a signal the tool handles, a write leaves nothing.
  const std::string written = ReadFile(file);
  RunWithFault({"set", "packet.png", "xmp:Label=Red"}, "write:TERM:1:" + folder, "OVRA_FAULT_NO_TMPFILE=1");
  EXPECT_TRUE(Fired());
  EXPECT_EQ(ReadFile(file), written);
  EXPECT_TRUE(Leftovers().empty());
}

TEST_F(WriteFault, FormatsBehavedDifferentlyForReadOnlyFilesAndSizeLimits) {
  const std::string kLong(6000, 'x');
  for (const std::string name : {"packet.png", "exif-dates.jpg", "timecode.mp4"}) {
    const fs::path file = Medium(name);
    const std::string bytes = ReadFile(file);
    fs::permissions(file, fs::perms::owner_read | fs::perms::group_read | fs::perms::others_read,
                    fs::perm_options::replace);
    const Result readOnly = Run({"set", name, "xmp:Label=Blue"});
    EXPECT_EQ(readOnly.status, 2) << name;
    ExpectContains(readOnly.err, {name + ": cannot write file: the file is not writable: Permission denied"});
    fs::permissions(file, fs::perms::owner_read | fs::perms::owner_write, fs::perm_options::replace);
    const Result limited = Run({"set", name, "dc:description=" + kLong}, "ulimit -f 8 &&");
    EXPECT_EQ(limited.status, 2) << name;
    ExpectContains(limited.err, {name + ": cannot write file: ", "File too large"});
    EXPECT_EQ(ReadFile(file), bytes) << name;
  }
}

TEST_F(WriteFault, TwoRunsAtOnceKeptOnlyOneEdit) {
  std::vector<std::string> names;
  for (int i = 0; i < 12; ++i) {
    names.push_back("m" + std::to_string(i) + ".jpg");
    CopyIn(ovratest::DataDir() / "media" / "member-a.jpg", names.back());
  }
  std::vector<std::string> label = {"set"}, rating = {"set"};
  label.insert(label.end(), names.begin(), names.end());
  rating.insert(rating.end(), names.begin(), names.end());
  label.push_back("xmp:Label=Both");
  rating.push_back("xmp:Rating=2");
  const std::string output = RunCommand("cd " + Quote(mDir.path().string()) + " && { (" + Command(label) +
                                        " 2>&1; echo label $?) & (" + Command(rating) +
                                        " 2>&1; echo rating $?) & wait; }");
  ExpectContains(output, {"label 0", "rating 0"});
  for (const std::string& name : names) {
    EXPECT_EQ(Get(mDir / name, "xmp:Label"), "Both") << name;
    EXPECT_EQ(Get(mDir / name, "xmp:Rating"), "Two Stars") << name;
  }
}

}  // namespace
