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

TEST(FileProvider, WriteBackIsReadAgainAndAFailedOneKeepsItsReason) {
  ovratest::TempDir dir;
  const fs::path file =
      ovratest::MakeMediaFile(dir.path(), "clip", MediaKind::MP4, "<pt:Title>before</pt:Title><xmp:Label>red</xmp:Label>");
  auto provider = ovratest::OpenFile(file);
  const Path label = PathForSchemaNameAndPropertyName(UTF8String(ovraxmp::kXMP_NS_XMP), "Label");
  ASSERT_EQ(ovratest::Text(provider->MetaDataAccess(), label), "red");
  Edit(provider, label, "green");
  EXPECT_TRUE(provider->LastWriteFailure().empty());
  EXPECT_EQ(ovratest::Text(ovratest::OpenFile(file)->MetaDataAccess(), label), "green");
  // Silent, but the host may ask why; a file gone is not made again.
  fs::remove(file);
  EXPECT_NO_THROW(Edit(provider, ovratest::TestPath("Title"), "after"));
  EXPECT_FALSE(provider->LastWriteFailure().empty());
  EXPECT_TRUE(fs::is_empty(dir.path()));
}

TEST(FileProvider, DisabledWritingLeavesTheFileUntouched) {
  ovratest::TempDir dir;
  const fs::path file = ovratest::MakeMediaFile(dir.path(), "locked", MediaKind::JPEG, "<pt:Title>before</pt:Title>");
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

TEST(FileProvider, FileWithoutXMPGivesNullMetadataAndIsNeverWritten) {
  // A WAV file without XMP: the JPEG and MP4 handlers build a packet from
  // the file's native data instead, so they always have XMP to show.
  ovratest::TempDir dir;
  const fs::path file = ovratest::MakeMediaFile(dir.path(), "bare", MediaKind::WAV, "");
  const std::string before = ovratest::ReadFile(file);
  auto provider = ovratest::OpenFile(file);
  EXPECT_EQ(provider->MetaDataAccess(), nullptr);
  ovratest::Touch(provider, ovratest::TestPath("Title"));
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

}  // namespace
