// Buffer and file providers: loading, write-back, silence on failure, and
// no data loss when a write-back cannot happen.
#include <sys/stat.h>
#include <fcntl.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <boost/make_shared.hpp>

#include <ovrametadata/Initialize.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/Values.h>

#include "MediaFiles.h"
#include "ProviderTestSupport.h"
#include "TestSupport.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ovratest::CallCounter;
using ovratest::Edit;
using ovratest::WritingDisabledScope;
using ovratest::MediaKind;
using ovratest::RecordingBufferProvider;

// ---------------------------------------------------------------------------
// BufferProviderImpl

TEST(BufferProvider, NoBytesGiveAnEmptyPacketNotNull) {
  RecordingBufferProvider provider("");
  ASSERT_NE(provider.MetaDataAccess(), nullptr);
  EXPECT_EQ(ovratest::Raw(provider.MetaDataAccess(), ovratest::kTestNS, "Title"), "<absent>");
  auto nullData = boost::make_shared<RecordingBufferProvider>("x");
  nullData->ResetBuffer(nullptr, 10);
  EXPECT_NE(nullData->MetaDataAccess(), nullptr);
}

TEST(BufferProvider, InvalidBytesGiveNullMetadataAndANotification) {
  auto provider = RecordingBufferProvider::FromProperties("<pt:Title>t</pt:Title>");
  CallCounter counter;
  provider->NotifyWhenMetaDataChanged(counter.callback);
  const std::string garbage = "<x:xmpmeta><rdf:RDF><unclosed";
  ovratest::ErrorsSince errors;
  provider->ResetBuffer(reinterpret_cast<const unsigned char*>(garbage.data()), garbage.size());
  EXPECT_EQ(provider->MetaDataAccess(), nullptr);
  ASSERT_EQ(*counter.calls, 1);
  EXPECT_EQ((*counter.handles)[0], nullptr);
  EXPECT_TRUE(errors.New().empty());  // silent
}

TEST(BufferProvider, WriteBackHandsTheSerialisedPacketToTheOwner) {
  auto provider = RecordingBufferProvider::FromProperties("<pt:Title>before</pt:Title>");
  Edit(provider, ovratest::TestPath("Title"), "after");
  ASSERT_EQ(provider->writes.size(), 1u);
  // Reading the bytes again gives the edit.
  RecordingBufferProvider reread(provider->writes[0].bytes);
  EXPECT_EQ(ovratest::Text(reread.MetaDataAccess(), ovratest::TestPath("Title")), "after");
}

TEST(BufferProvider, WritesEvenWhileXMPWritingIsDisabled) {
  auto provider = RecordingBufferProvider::FromProperties("<pt:Title>before</pt:Title>");
  WritingDisabledScope disabled;
  Edit(provider, ovratest::TestPath("Title"), "after");
  EXPECT_EQ(provider->writes.size(), 1u);
}

TEST(BufferProvider, OwnerThatThrowsIsSwallowed) {
  auto provider = RecordingBufferProvider::FromProperties("<pt:Title>before</pt:Title>");
  provider->throwOnWrite = true;
  EXPECT_NO_THROW(Edit(provider, ovratest::TestPath("Title"), "after"));
  EXPECT_TRUE(provider->writes.empty());
}

// ---------------------------------------------------------------------------
// FileProvider

class FileProviderTest : public ::testing::TestWithParam<MediaKind> {
 protected:
  ovratest::TempDir dir;
};

TEST_P(FileProviderTest, WriteBackIsReadAgainByAFreshProviderAndByExifTool) {
  const fs::path file = ovratest::MakeMediaFile(
      dir.path(), "clip", GetParam(), "<pt:Title>before</pt:Title><xmp:Label>red</xmp:Label>");
  auto provider = ovratest::OpenFile(file);
  ASSERT_NE(provider->MetaDataAccess(), nullptr);
  const Path label = PathForSchemaNameAndPropertyName(UTF8String(ovraxmp::kXMP_NS_XMP), "Label");
  ASSERT_EQ(ovratest::Text(provider->MetaDataAccess(), label), "red");
  Edit(provider, label, "green");
  Edit(provider, ovratest::TestPath("Title"), "after");

  auto fresh = ovratest::OpenFile(file);
  EXPECT_EQ(ovratest::Text(fresh->MetaDataAccess(), label), "green");
  EXPECT_EQ(ovratest::Text(fresh->MetaDataAccess(), ovratest::TestPath("Title")), "after");

  if (!ovratest::media::HaveExifTool()) GTEST_SKIP() << "exiftool is not installed";
  EXPECT_EQ(ovratest::media::ExifToolValue(file, "XMP-xmp:Label"), "green");
}

TEST_P(FileProviderTest, DisabledWritingLeavesTheFileUntouched) {
  const fs::path file =
      ovratest::MakeMediaFile(dir.path(), "locked", GetParam(), "<pt:Title>before</pt:Title>");
  const std::string before = ovratest::ReadFile(file);
  auto provider = ovratest::OpenFile(file);
  {
    WritingDisabledScope disabled;
    Edit(provider, ovratest::TestPath("Title"), "after");
  }
  EXPECT_EQ(ovratest::ReadFile(file), before);
  // The packet in memory has the edit all the same.
  EXPECT_EQ(ovratest::Text(provider->MetaDataAccess(), ovratest::TestPath("Title")), "after");
}

TEST_P(FileProviderTest, FileDeletedBeforeWriteBackIsNotRecreated) {
  const fs::path file =
      ovratest::MakeMediaFile(dir.path(), "gone", GetParam(), "<pt:Title>before</pt:Title>");
  auto provider = ovratest::OpenFile(file);
  ASSERT_NE(provider->MetaDataAccess(), nullptr);
  fs::remove(file);
  EXPECT_NO_THROW(Edit(provider, ovratest::TestPath("Title"), "after"));
  EXPECT_FALSE(fs::exists(file));
  EXPECT_TRUE(fs::is_empty(dir.path()));
}

TEST_P(FileProviderTest, FileReplacedByAFolderIsLeftAlone) {
  const fs::path file =
      ovratest::MakeMediaFile(dir.path(), "swapped", GetParam(), "<pt:Title>before</pt:Title>");
  const fs::path neighbour =
      ovratest::MakeMediaFile(dir.path(), "neighbour", GetParam(), "<pt:Title>n</pt:Title>");
  const std::string neighbourBefore = ovratest::ReadFile(neighbour);
  auto provider = ovratest::OpenFile(file);
  ASSERT_NE(provider->MetaDataAccess(), nullptr);
  fs::remove(file);
  fs::create_directory(file);
  ovratest::WriteFile(file / "inside.txt", "keep");
  EXPECT_NO_THROW(Edit(provider, ovratest::TestPath("Title"), "after"));
  EXPECT_TRUE(fs::is_directory(file));
  EXPECT_EQ(ovratest::ReadFile(file / "inside.txt"), "keep");
  EXPECT_EQ(std::distance(fs::directory_iterator(file), fs::directory_iterator()), 1);
  EXPECT_EQ(ovratest::ReadFile(neighbour), neighbourBefore);
  // Nothing was left behind beside the two entries (no temporary file).
  EXPECT_EQ(std::distance(fs::directory_iterator(dir.path()), fs::directory_iterator()), 2);
}

TEST_P(FileProviderTest, UnwritableFileIsLeftByteForByte) {
  const fs::path folder = dir / "readonly";
  fs::create_directory(folder);
  const fs::path file =
      ovratest::MakeMediaFile(folder, "ro", GetParam(), "<pt:Title>before</pt:Title>");
  const std::string before = ovratest::ReadFile(file);
  auto provider = ovratest::OpenFile(file);
  ASSERT_NE(provider->MetaDataAccess(), nullptr);
  ASSERT_EQ(::chmod(file.c_str(), 0444), 0);
  ASSERT_EQ(::chmod(folder.c_str(), 0555), 0);
  const int code = ovratest::RunWithoutPermissionOverride([&]() -> int {
    // Prove that the file really cannot be written before trying.
    const int fd = ::open(file.c_str(), O_WRONLY);
    if (fd >= 0) {
      ::close(fd);
      return 77;
    }
    Edit(provider, ovratest::TestPath("Title"), "after");
    return 0;
  });
  ::chmod(folder.c_str(), 0755);
  ::chmod(file.c_str(), 0644);
  if (code == 77) GTEST_SKIP() << "cannot give up the power to override permissions here";
  ASSERT_EQ(code, 0);
  EXPECT_EQ(ovratest::ReadFile(file), before);
  EXPECT_EQ(std::distance(fs::directory_iterator(folder), fs::directory_iterator()), 1);
}

INSTANTIATE_TEST_SUITE_P(Media, FileProviderTest,
                         ::testing::Values(MediaKind::JPEG, MediaKind::MP4, MediaKind::WAV),
                         [](const ::testing::TestParamInfo<MediaKind>& info) {
                           return ovratest::MediaExtension(info.param).substr(1);
                         });

TEST(FileProvider, FileWithoutXMPGivesNullMetadataAndIsNeverWritten) {
  // A WAV file without XMP: the JPEG and MP4 handlers build a packet from
  // the file's native data instead, so they always have XMP to show.
  ovratest::TempDir dir;
  const fs::path file = ovratest::MakeMediaFile(dir.path(), "bare", MediaKind::WAV, "");
  const std::string before = ovratest::ReadFile(file);
  auto provider = ovratest::OpenFile(file);
  EXPECT_EQ(provider->MetaDataAccess(), nullptr);
  {
    MetaDataUpdateAccess access(provider);
    access.AddChange(ovratest::TestPath("Title"));
  }
  EXPECT_EQ(ovratest::ReadFile(file), before);
}

TEST(FileProvider, EmptyPathHoldsNullMetadataAndTouchesNoFile) {
  FileProvider provider(u"");
  EXPECT_EQ(provider.MetaDataAccess(), nullptr);
  EXPECT_TRUE(provider.FilePath().empty());
}

TEST(FileProvider, ResetFilePathReloadsOnlyForAnotherPath) {
  ovratest::TempDir dir;
  const fs::path first =
      ovratest::MakeMediaFile(dir.path(), "a", MediaKind::JPEG, "<pt:Title>A</pt:Title>");
  const fs::path second =
      ovratest::MakeMediaFile(dir.path(), "b", MediaKind::JPEG, "<pt:Title>B</pt:Title>");
  auto provider = ovratest::OpenFile(first);
  CallCounter counter;
  provider->NotifyWhenMetaDataChanged(counter.callback);
  provider->ResetFilePath(ovratest::U16Path(first));
  EXPECT_EQ(*counter.calls, 0);
  provider->ResetFilePath(ovratest::U16Path(second));
  EXPECT_EQ(*counter.calls, 1);
  EXPECT_EQ(ovratest::Text(provider->MetaDataAccess(), ovratest::TestPath("Title")), "B");
  // An unreadable file still reloads and notifies, with null metadata.
  provider->ResetFilePath(ovratest::U16Path(dir / "missing.jpg"));
  EXPECT_EQ(*counter.calls, 2);
  EXPECT_EQ(provider->MetaDataAccess(), nullptr);
  EXPECT_EQ((*counter.handles)[1], nullptr);
}

TEST(FileProvider, ValueWrittenByExifToolIsRead) {
  if (!ovratest::media::HaveExifTool()) GTEST_SKIP() << "exiftool is not installed";
  ovratest::TempDir dir;
  const fs::path file = ovratest::MakeMediaFile(dir.path(), "tool", MediaKind::JPEG, "");
  ovratest::media::RunCommand("LC_ALL=C exiftool -q -overwrite_original -XMP-xmp:Label=violet '" +
                              file.string() + "'");
  auto provider = ovratest::OpenFile(file);
  const Path label = PathForSchemaNameAndPropertyName(UTF8String(ovraxmp::kXMP_NS_XMP), "Label");
  EXPECT_EQ(ovratest::Text(provider->MetaDataAccess(), label), "violet");
}

}  // namespace
