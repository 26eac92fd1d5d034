// Providers facing hostile input and failing writes: hostile buffers and
// files give null metadata (the file keeps its bytes), a write-back that
// the toolkit refuses is reported instead of ending the process, a write
// that runs out of space leaves the original, and reads through aliases are
// quiet.
#include <signal.h>
#include <sys/resource.h>

#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include <ovrametadata/MetadataUtils.h>

#include "../xmp/HostileInputs.h"
#include "MediaFiles.h"
#include "ProviderTestSupport.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ovratest::Edit;
using ovratest::MediaKind;

// ---------------------------------------------------------------------------
// Hostile input

TEST(HostileInput, BuffersThatTheToolkitMustNotParseGiveNullMetadata) {
  const std::string buffers[] = {hostile::DeepResources(100000), hostile::ManyProperties(200000),
                                 hostile::BillionLaughs(), hostile::InvalidUTF8(), std::string("\0\0\0", 3)};
  for (const std::string& bytes : buffers) {
    const auto run = hostile::RunIsolated([&] {
      ovratest::RecordingBufferProvider provider(bytes);
      return provider.MetaDataAccess() == nullptr ? 0 : 1;
    });
    EXPECT_TRUE(run.exited) << "signal " << -run.code;
    EXPECT_EQ(run.code, 0) << bytes.substr(0, 80);
    EXPECT_LT(run.seconds, 20);
  }
}

// In a child process: the provider holds null metadata, an edit writes
// nothing, and the format cache still names the format. The file keeps its bytes.
void ExpectRefusedAndUntouched(const fs::path& file, XMP_FileFormat format) {
  const std::string bytes = ovratest::ReadFile(file);
  const auto run = hostile::RunIsolated([&] {
    auto provider = ovratest::OpenFile(file);
    if (provider->MetaDataAccess() != nullptr) return 1;
    Edit(provider, PathForSchemaNameAndPropertyName(UTF8String(ovraxmp::kXMP_NS_DC), "format"), "overwritten");
    if (utility::GetXMPFormat(ovratest::U16Path(file)) != format) return 2;
    return 0;
  });
  EXPECT_TRUE(run.exited) << file.filename() << ": signal " << -run.code;
  EXPECT_EQ(run.code, 0) << file.filename();
  EXPECT_LT(run.seconds, 20) << file.filename();
  EXPECT_EQ(ovratest::ReadFile(file), bytes) << file.filename();
}

TEST(HostileInput, FilesThatTheHandlersMustNotOpenHoldNullMetadataAndAreNeverWritten) {
  ovratest::TempDir dir;
  const struct {
    const char* file;
    XMP_FileFormat format;
    std::string bytes;
  } cases[] = {
      {"ext.jpg", 0x4A504547,
       hostile::JpegWithExtendedXMP(xmptest::media::Jpeg(), hostile::DeepResources(100000))},
      {"garbage.jpg", 0x4A504547, hostile::JpegWithPacket(xmptest::media::Jpeg(), "<x:xmpmeta garbage \x01\x02")},
      {"empty.jpg", 0x4A504547, hostile::JpegWithPacket(xmptest::media::Jpeg(), "")},
      {"udta.mp4", 0x4D503420, hostile::Mp4WithNestedUdta(xmptest::media::Mp4(), 20000)},
      {"moov.mp4", 0x4D503420,
       hostile::WithBrokenBoxSize(xmptest::media::Mp4() + hostile::XMPBox(hostile::Packet("<dc:format>x</dc:format>")),
                                  "moov")},
  };
  for (const auto& c : cases) {
    ovratest::WriteFile(dir / c.file, c.bytes);
    ExpectRefusedAndUntouched(dir / c.file, c.format);
  }
}

TEST(HostileInput, CheckedInHostileFilesStayUnreadAndUntouched) {
  // Minimal inputs kept as regression cases, independent of the generators.
  ovratest::TempDir dir;
  int seen = 0;
  for (const auto& entry : fs::directory_iterator(ovratest::DataDir() / "hostile")) {
    ++seen;
    const fs::path file = dir / entry.path().filename();
    fs::copy_file(entry.path(), file);
    const std::string ext = file.extension().string();
    ExpectRefusedAndUntouched(file, ext == ".jpg" ? 0x4A504547 : ext == ".mp4" ? 0x4D503420 : 0x57415620);
  }
  EXPECT_GE(seen, 8);
}

TEST(HostileInput, AliasedPropertiesAreReadQuietly) {
  const ovraxmp::XMPMeta packet = ovratest::Packet(
      "<dc:description><rdf:Alt><rdf:li xml:lang=\"x-default\">A harbour</rdf:li></rdf:Alt></dc:description>"
      "<dc:rights><rdf:Alt><rdf:li xml:lang=\"x-default\">(c) Ana</rdf:li></rdf:Alt></dc:rights>"
      "<dc:creator><rdf:Seq><rdf:li>Ana</rdf:li><rdf:li>Ben</rdf:li></rdf:Seq></dc:creator>");
  const UTF8String tiff(ovraxmp::kXMP_NS_TIFF);
  const ovratest::ErrorsSince errors;
  EXPECT_EQ(ovratest::Text(packet.GetInternalRef(), PathForSchemaNameAndPropertyName(tiff, "ImageDescription")),
            "A harbour");
  EXPECT_EQ(ovratest::Text(packet.GetInternalRef(), PathForSchemaNameAndPropertyName(tiff, "Copyright")), "(c) Ana");
  EXPECT_EQ(ovratest::Text(packet.GetInternalRef(), PathForSchemaNameAndPropertyName(tiff, "Artist")), "Ana");
  for (const ErrorInfo& error : errors.New()) ADD_FAILURE() << ovracore::ToUTF8(error.message);
}

// ---------------------------------------------------------------------------
// Write-backs that fail

// A provider whose write-back meets a toolkit error, as history recording or
// distribution to members can.
class FailingProvider : public TypicalProviderImpl {
 public:
  FailingProvider() : TypicalProviderImpl(nullptr) { ResetToEmptyMetaData(false); }
  void WriteChanges(const std::vector<Path>&) override {
    ovraxmp::XMPMeta meta(MetaDataAccess());
    meta.SetProperty("http://ns.example.org/never-registered/", "p", "v");
  }
};

TEST(WriteBackFailure, ToolkitErrorInAGuardIsReportedNotFatal) {
  auto provider = boost::make_shared<FailingProvider>();
  const ovratest::ErrorsSince errors;
  const Path path = ovratest::TestPath("Title");
  EXPECT_NO_THROW({
    MetaDataUpdateAccess access(provider);
    access.AddChange(path);
  });
  const std::vector<ErrorInfo> reported = errors.New();
  ASSERT_EQ(reported.size(), 1u);
  EXPECT_EQ(reported[0].type, kErrorWritingXMP);
  EXPECT_NE(ovracore::ToUTF8(reported[0].message).find(path.namespaceURI + path.description), std::string::npos)
      << ovracore::ToUTF8(reported[0].message);
}

TEST(WriteBackFailure, WriteThatRunsOutOfSpaceLeavesTheOriginalByteForByte) {
  for (MediaKind kind : {MediaKind::JPEG, MediaKind::MP4, MediaKind::WAV}) {
    ovratest::TempDir dir;
    const fs::path file = ovratest::MakeMediaFile(dir.path(), "full", kind, "<pt:Title>before</pt:Title>");
    const std::string before = ovratest::ReadFile(file);
    auto provider = ovratest::OpenFile(file);
    ASSERT_NE(provider->MetaDataAccess(), nullptr);
    const auto run = hostile::RunIsolated([&] {
      // Any file may grow to just below the current size: the new copy
      // cannot be written in full.
      signal(SIGXFSZ, SIG_IGN);
      struct rlimit limit {};
      limit.rlim_cur = limit.rlim_max = before.size() / 2;
      if (setrlimit(RLIMIT_FSIZE, &limit) != 0) return 77;
      Edit(provider, ovratest::TestPath("Title"), std::string(before.size(), 'x'));
      return 0;
    });
    EXPECT_TRUE(run.exited) << "signal " << -run.code;
    EXPECT_EQ(run.code, 0);
    EXPECT_EQ(ovratest::ReadFile(file), before) << ovratest::MediaExtension(kind);
    EXPECT_EQ(std::distance(fs::directory_iterator(dir.path()), fs::directory_iterator()), 1)
        << ovratest::MediaExtension(kind) << ": a temporary file was left behind";
  }
}

}  // namespace
