#include <chrono>
#include <csignal>
#include <filesystem>
#include <future>
#include <string>

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <ovracore/FileSupport.h>
#include <ovracore/SafeWrite.h>

#include "../xmp/XMPMediaFiles.h"
#include "TestSupport.h"

using namespace ovracore;
using namespace ovracore::filesupport;
using ovratest::ScopedEnv;
namespace fs = std::filesystem;

namespace {

UTF16String U(const fs::path& path) { return FromFSPath(path); }

std::size_t EntriesIn(const fs::path& folder) {
  return static_cast<std::size_t>(std::distance(fs::directory_iterator(folder), fs::directory_iterator()));
}

// Replaces the file with text through a FileReplacement; the problem, or
// empty when it worked.
std::string Replace(const fs::path& file, const std::string& text) {
  FileReplacement replacement;
  std::string problem;
  if (replacement.Open(file.string(), false, &problem) && replacement.Begin(text.size(), &problem) &&
      replacement.Append(text, &problem) && replacement.Commit(&problem))
    return std::string();
  return problem;
}

}  // namespace

TEST(FilesAndFolders, NamesPartsAndListing) {
  ovratest::TempDir dir;
  ovratest::WriteFile(dir / "b.xml", "b");
  ovratest::WriteFile(dir / "a.XML", "a");
  ovratest::WriteFile(dir / "sub" / "nested.xml", "n");
  fs::create_directories(dir / "\xC3\xA9t\xC3\xA9");

  const Dir folder(dir.path());
  ASSERT_TRUE(folder.Exists());
  const std::vector<File> files = folder.Files();
  ASSERT_EQ(files.size(), 2u);
  EXPECT_EQ(files[0].Name(), u"a.XML");
  EXPECT_EQ(files[1].Title(), u"b");
  EXPECT_EQ(files[1].Extension(), u".xml");
  const std::vector<Dir> subs = folder.SubDirs();
  ASSERT_EQ(subs.size(), 2u);
  EXPECT_EQ(subs[0].Name(), u"sub");
  EXPECT_EQ(subs[1].Name(), u"\u00E9t\u00E9");

  const File nested = folder.SubDir(u"sub").FileNamed(u"nested.xml");
  EXPECT_TRUE(nested.Exists());
  EXPECT_TRUE(nested.ModificationTime().has_value());
  EXPECT_EQ(File(dir / "sub" / ".." / "b.xml").FullPath(), U(dir / "b.xml"));
  EXPECT_FALSE(File(dir / "sub").Exists());  // a folder is no file
  EXPECT_FALSE(File(dir / "none").ModificationTime());
  EXPECT_TRUE(Dir(dir / "none").Files().empty());
  EXPECT_EQ(File(u"archive.tar.gz").Title(), u"archive.tar");
  EXPECT_EQ(File(u"README").Extension(), u"");
}

TEST(FilesAndFolders, CreateWithParentsAndWholeFileHelpers) {
  ovratest::TempDir dir;
  const Dir deep = Dir(dir.path()).SubDir(u"x/y/z");
  EXPECT_TRUE(FileUtils::EnsureDirectoryExists(deep));
  EXPECT_TRUE(fs::is_directory(dir / "x" / "y" / "z"));
  ovratest::WriteFile(dir / "blocker", "file");
  EXPECT_FALSE(Dir(dir / "blocker" / "sub").Create());

  const File file = deep.FileNamed(u"data.txt");
  EXPECT_TRUE(SimpleWriteStringToFile(file, std::string("a\0b", 3)));
  EXPECT_EQ(ReadFileToString(file.FullPath()), std::string("a\0b", 3));
  EXPECT_FALSE(ReadFileToString(file.FullPath(), 2));
  EXPECT_FALSE(ReadFileToString(U(dir / "missing")));
  EXPECT_FALSE(ReadFileToString(U(dir / "x")));
  EXPECT_FALSE(SimpleWriteStringToFile(File(dir / "nowhere" / "f"), "x"));
}

TEST(SafeSave, ReplacesContentKeepsModeAndLeavesNoTemporaryFile) {
  ovratest::TempDir dir;
  const fs::path target = dir / "PropsheetMRU.xml";
  ASSERT_TRUE(SafeSave(U(target), "first"));
  EXPECT_EQ(ovratest::ReadFile(target), "first");
  fs::permissions(target, fs::perms::owner_read | fs::perms::owner_write | fs::perms::group_read);
  ASSERT_TRUE(SafeSave(U(target), "second, longer content"));
  EXPECT_EQ(ovratest::ReadFile(target), "second, longer content");
  EXPECT_EQ(fs::status(target).permissions() & fs::perms::all,
            fs::perms::owner_read | fs::perms::owner_write | fs::perms::group_read);
  EXPECT_EQ(EntriesIn(dir.path()), 1u);

  // Through a link the linked file is replaced and the link stays a link.
  const fs::path link = dir / "link.xml";
  fs::create_symlink(target, link);
  ASSERT_TRUE(SafeSave(U(link), "third"));
  EXPECT_TRUE(fs::is_symlink(link));
  EXPECT_EQ(ovratest::ReadFile(target), "third");
}

TEST(SafeSave, FailedWriteLeavesOldFileIntact) {
  ovratest::TempDir dir;
  const fs::path target = dir / "target.xml";
  ovratest::WriteFile(target, "old");
  // A file size limit makes the write fail halfway, whatever our rights are.
  struct rlimit saved {};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &saved), 0);
  const auto oldHandler = std::signal(SIGXFSZ, SIG_IGN);
  struct rlimit tiny = saved;
  tiny.rlim_cur = 8;
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &tiny), 0);
  const bool written = SafeSave(U(target), "much more than eight bytes");
  ::setrlimit(RLIMIT_FSIZE, &saved);
  std::signal(SIGXFSZ, oldHandler);
  EXPECT_FALSE(written);
  EXPECT_EQ(ovratest::ReadFile(target), "old");
  EXPECT_EQ(EntriesIn(dir.path()), 1u);
}

TEST(SafeSave, UnwritableOrInvalidTargetsFail) {
  ovratest::TempDir dir;
  // A target that is a folder cannot be replaced; the temporary file goes.
  fs::create_directories(dir / "isdir" / "child");
  EXPECT_FALSE(SafeSave(U(dir / "isdir"), "x"));
  EXPECT_TRUE(fs::is_directory(dir / "isdir" / "child"));
  EXPECT_EQ(EntriesIn(dir.path()), 1u);
  EXPECT_FALSE(SafeSave(U(dir / "missing" / "f.xml"), "x"));
  EXPECT_FALSE(SafeSave(u"", "x"));

  const fs::path folder = dir / "locked";
  ovratest::WriteFile(folder / "target.xml", "old");
  fs::permissions(folder, fs::perms::owner_read | fs::perms::owner_exec);
  const bool ignoresPermissions = ::access(folder.c_str(), W_OK) == 0;
  if (!ignoresPermissions) {
    EXPECT_FALSE(SafeSave(U(folder / "target.xml"), "new"));
  }
  fs::permissions(folder, fs::perms::owner_all);
  EXPECT_EQ(ovratest::ReadFile(folder / "target.xml"), "old");
  EXPECT_EQ(EntriesIn(folder), 1u);
}

TEST(DataRoots, OverridesXdgAndHome) {
  const char* kMessage = "$$$/ovracore/filesupport/DirCommonFiles=Could not find the common files directory.";
  {
    ScopedEnv user("OVRAMETADATA_USER_ROOT", "/tmp/ovra-user-root");
    ScopedEnv local("OVRAMETADATA_LOCAL_ROOT", "/tmp/ovra-local-root");
    EXPECT_EQ(ApplicationSupportFolder_User().FullPath(), u"/tmp/ovra-user-root");
    EXPECT_EQ(ApplicationSupportFolder_Local().FullPath(), u"/tmp/ovra-local-root");
  }
  {
    ScopedEnv user("OVRAMETADATA_USER_ROOT", nullptr);
    ScopedEnv local("OVRAMETADATA_LOCAL_ROOT", nullptr);
    ScopedEnv home("HOME", "/home/someone");
    {
      ScopedEnv xdg("XDG_DATA_HOME", "/data/xdg");
      EXPECT_EQ(ApplicationSupportFolder_User().FullPath(), u"/data/xdg");
    }
    {
      ScopedEnv xdg("XDG_DATA_HOME", "relative/ignored");
      EXPECT_EQ(ApplicationSupportFolder_User().FullPath(), u"/home/someone/.local/share");
    }
    ScopedEnv xdg("XDG_DATA_HOME", nullptr);
    EXPECT_EQ(ApplicationSupportFolder_User().FullPath(), u"/home/someone/.local/share");
    EXPECT_EQ(ApplicationSupportFolder_Local().FullPath(), u"/usr/local/share");
    ScopedEnv noHome("HOME", nullptr);
    try {
      ApplicationSupportFolder_User();
      ADD_FAILURE() << "no root expected without HOME";
    } catch (const DirectoryException& e) {
      EXPECT_STREQ(e.what(), kMessage);
    }
  }
  ScopedEnv emptyUser("OVRAMETADATA_USER_ROOT", "");
  ScopedEnv emptyLocal("OVRAMETADATA_LOCAL_ROOT", "");
  EXPECT_THROW(ApplicationSupportFolder_User(), DirectoryException);
  EXPECT_THROW(ApplicationSupportFolder_Local(), DirectoryException);
}

TEST(DataRoots, PluginsFolderDefaultsBesideModuleAndCanBeSet) {
  const Dir fallback = PluginsFolder();
  EXPECT_EQ(fallback.Name(), u"plugins");
  // In a test program the module is the program itself.
  std::error_code ec;
  const fs::path exe = fs::read_symlink("/proc/self/exe", ec);
  if (!ec) {
    EXPECT_EQ(fallback.FSPath().parent_path(), exe.parent_path().lexically_normal());
  }
  SetPluginsFolder(u"/opt/host/PlugIns");
  EXPECT_EQ(PluginsFolder().FullPath(), u"/opt/host/PlugIns");
  SetPluginsFolder(u"");
  EXPECT_EQ(PluginsFolder().FullPath(), fallback.FullPath());
}

TEST(FileReplacement, OwnerGroupAndSetIDBitsAreKeptWhereTheProcessMay) {
  if (::geteuid() != 0) GTEST_SKIP() << "only the superuser may give a file to another user";
  ovratest::TempDir dir;
  const fs::path file = dir / "owned.jpg";
  ovratest::WriteFile(file, "old");
  ASSERT_EQ(::chown(file.c_str(), 4321, 4322), 0);
  ASSERT_EQ(::chmod(file.c_str(), 06750), 0);
  EXPECT_EQ(Replace(file, "new"), "");
  struct stat info {};
  ASSERT_EQ(::stat(file.c_str(), &info), 0);
  EXPECT_EQ(info.st_uid, 4321u);
  EXPECT_EQ(info.st_gid, 4322u);
  EXPECT_EQ(info.st_mode & 07777, 06750u);
}

TEST(FileReplacement, ExtendedAttributesAndAccessListsAreKept) {
  ovratest::TempDir dir;
  const fs::path file = dir / "tagged.jpg";
  ovratest::WriteFile(file, "old");
  if (::setxattr(file.c_str(), "user.ovra.note", "kept", 4, 0) != 0) GTEST_SKIP() << "no user attributes here";
  const bool acl = std::system(("setfacl -m u:4321:r " + file.string() + " 2>/dev/null").c_str()) == 0;
  const std::string before = xmptest::media::RunCommand("getfacl -cp " + file.string() + " 2>/dev/null");
  const auto mode = fs::status(file).permissions();
  EXPECT_EQ(Replace(file, "new"), "");
  char value[16] = {};
  EXPECT_EQ(::getxattr(file.c_str(), "user.ovra.note", value, sizeof value), 4);
  EXPECT_STREQ(value, "kept");
  if (acl) {
    EXPECT_EQ(xmptest::media::RunCommand("getfacl -cp " + file.string() + " 2>/dev/null"), before);
  }
  EXPECT_EQ(fs::status(file).permissions(), mode);
}

TEST(FileReplacement, AFileMovedAwayWhileItIsWrittenIsNotReplaced) {
  ovratest::TempDir dir;
  const fs::path file = dir / "clip.mov";
  ovratest::WriteFile(file, "old");
  FileReplacement replacement;
  std::string problem;
  ASSERT_TRUE(replacement.Open(file.string(), false, &problem)) << problem;
  ASSERT_TRUE(replacement.Begin(3, &problem) && replacement.Append("new", &problem)) << problem;
  fs::rename(file, dir / "elsewhere.mov");
  EXPECT_FALSE(replacement.Commit(&problem));
  EXPECT_EQ(problem, "the file was moved or replaced while it was being written");
  EXPECT_FALSE(fs::exists(file));
  EXPECT_EQ(ovratest::ReadFile(dir / "elsewhere.mov"), "old");
  EXPECT_EQ(EntriesIn(dir.path()), 1u);
}

TEST(FileReplacement, WritersOfOneFileTakeTurnsAndReadWhatTheOtherWrote) {
  ovratest::TempDir dir;
  const fs::path file = dir / "shared.xmp";
  ovratest::WriteFile(file, "old");
  FileReplacement first;
  std::string problem;
  ASSERT_TRUE(first.Open(file.string(), false, &problem)) << problem;
  auto second = std::async(std::launch::async, [&] {
    FileReplacement replacement;
    std::string why;
    if (!replacement.Open(file.string(), false, &why)) return why;
    char seen[8] = {};
    return std::string(seen, static_cast<std::size_t>(::pread(replacement.ReadFD(), seen, sizeof seen, 0)));
  });
  EXPECT_EQ(second.wait_for(std::chrono::milliseconds(200)), std::future_status::timeout);
  ASSERT_TRUE(first.Begin(5, &problem) && first.Append("first", &problem) && first.Commit(&problem)) << problem;
  EXPECT_EQ(second.get(), "first");
}
