// The file-format cache and the associated files of a media file.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <boost/date_time/posix_time/posix_time.hpp>

#include <ovracore/Strings.h>
#include <ovraxmp/XMPConsts.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/MetadataUtils.h>

#include "../xmp/XMPMediaFiles.h"
#include "MetadataUtilsInternal.h"
#include "TestSupport.h"

namespace {

namespace fs = std::filesystem;
namespace pt = boost::posix_time;
using namespace ovrametadata;
using namespace ovrametadata::utility;

class LibraryEnvironment : public ::testing::Environment {
 public:
  void SetUp() override { Initialize(); }
  void TearDown() override { Terminate(); }
};
::testing::Environment* const kEnvironment =
    ::testing::AddGlobalTestEnvironment(new LibraryEnvironment);

std::u16string U16(const fs::path& path) { return ovracore::ToUTF16(path.string()); }

// How many files format detection opened while `call` ran.
template <typename Call>
std::uint64_t OpensDuring(Call call) {
  const auto before = detail::FormatDetectionOpenCount();
  call();
  return detail::FormatDetectionOpenCount() - before;
}

class FormatCache : public ::testing::Test {
 protected:
  fs::path Make(const std::string& name, const std::string& bytes) {
    ovratest::WriteFile(dir / name, bytes);
    return dir / name;
  }
  static void ExpectCached(const fs::path& file, XMP_FileFormat format) {
    const auto entry = detail::CachedXMPFormat(U16(file));
    ASSERT_TRUE(entry) << file;
    EXPECT_EQ(entry->format, format) << file;
    EXPECT_FALSE(entry->modified.is_special()) << file;
  }
  ovratest::TempDir dir;
};

TEST_F(FormatCache, AMissingFileIsUnknownAndNotCached) {
  const std::u16string missing = U16(dir / "missing.jpg");
  EXPECT_EQ(OpensDuring([&] { EXPECT_EQ(GetXMPFormat(missing), ovraxmp::kXMP_UnknownFile); }), 0u);
  EXPECT_FALSE(detail::CachedXMPFormat(missing));
}

TEST_F(FormatCache, DetectsEachFormatOnceWhileTheFileIsUnchanged) {
  const std::pair<fs::path, XMP_FileFormat> files[] = {
      {Make("a.jpg", xmptest::media::Jpeg()), ovraxmp::kXMP_JPEGFile},
      {Make("b.wav", xmptest::media::Wav()), ovraxmp::kXMP_WAVFile},
      {Make("c.mp4", xmptest::media::Mp4()), ovraxmp::kXMP_MPEG4File},
      // An unreadable file is cached as unknown.
      {Make("notes.jpg", "just some text, no image at all"), ovraxmp::kXMP_UnknownFile},
  };
  for (const auto& [file, format] : files) {
    const auto opens = OpensDuring([&, &file = file, &format = format] {
      for (int i = 0; i < 3; ++i) EXPECT_EQ(GetXMPFormat(U16(file)), format) << file;
    });
    EXPECT_EQ(opens, 1u) << file;
    ExpectCached(file, format);
  }
}

TEST_F(FormatCache, ATouchedFileIsDetectedAnewAndItsEntryReplaced) {
  const fs::path file = Make("clip.jpg", xmptest::media::Jpeg());
  ASSERT_EQ(GetXMPFormat(U16(file)), ovraxmp::kXMP_JPEGFile);
  const pt::ptime first = detail::CachedXMPFormat(U16(file))->modified;
  // The same name now holds a WAV file, five seconds later than the JPEG
  // (set explicitly: the rewrite itself moves the time by a few ms).
  const auto firstWrite = fs::last_write_time(file);
  ovratest::WriteFile(file, xmptest::media::Wav());
  fs::last_write_time(file, firstWrite + std::chrono::seconds(5));
  EXPECT_EQ(OpensDuring([&] { EXPECT_EQ(GetXMPFormat(U16(file)), ovraxmp::kXMP_WAVFile); }), 1u);
  ExpectCached(file, ovraxmp::kXMP_WAVFile);
  EXPECT_EQ(detail::CachedXMPFormat(U16(file))->modified - first, pt::seconds(5));
}

TEST_F(FormatCache, AddingNeverOverwritesAndNeedsAValidTime) {
  const fs::path file = Make("added.jpg", xmptest::media::Jpeg());
  const pt::ptime when(boost::gregorian::date(2020, 1, 2), pt::hours(3));
  AddCachedXMPFormat(U16(file), ovraxmp::kXMP_PNGFile, when);
  AddCachedXMPFormat(U16(file), ovraxmp::kXMP_TIFFFile, when + pt::hours(1));
  const auto entry = detail::CachedXMPFormat(U16(file));
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry->format, ovraxmp::kXMP_PNGFile);
  EXPECT_EQ(entry->modified, when);
  // The recorded time does not match the file: the next call detects anew.
  EXPECT_EQ(GetXMPFormat(U16(file)), ovraxmp::kXMP_JPEGFile);

  const std::u16string missing = U16(dir / "missing.jpg");
  for (const pt::ptime& time : {pt::ptime(pt::not_a_date_time), pt::ptime(pt::pos_infin)}) {
    AddCachedXMPFormat(missing, ovraxmp::kXMP_JPEGFile, time);
    EXPECT_FALSE(detail::CachedXMPFormat(missing));
  }

  // Not-a-date-time for an existing file takes the file's own time, so the
  // entry is then trusted without opening.
  const fs::path other = Make("other.wav", xmptest::media::Wav());
  AddCachedXMPFormat(U16(other), ovraxmp::kXMP_PNGFile, pt::ptime(pt::not_a_date_time));
  EXPECT_EQ(OpensDuring([&] { EXPECT_EQ(GetXMPFormat(U16(other)), ovraxmp::kXMP_PNGFile); }), 0u);
}

TEST_F(FormatCache, ErasingForgetsThePath) {
  const fs::path file = Make("erase.wav", xmptest::media::Wav());
  GetXMPFormat(U16(file));
  EraseCachedXMPFormat(U16(file));
  EXPECT_FALSE(detail::CachedXMPFormat(U16(file)));
  EraseCachedXMPFormat(U16(file));
  EXPECT_EQ(OpensDuring([&] { EXPECT_EQ(GetXMPFormat(U16(file)), ovraxmp::kXMP_WAVFile); }), 1u);
}

TEST_F(FormatCache, EightThreadsAtOnceAllGetTheRightFormat) {
  std::vector<std::pair<std::u16string, XMP_FileFormat>> files;
  for (int i = 0; i < 6; ++i) {
    files.emplace_back(U16(Make("j" + std::to_string(i) + ".jpg", xmptest::media::Jpeg())),
                       ovraxmp::kXMP_JPEGFile);
    files.emplace_back(U16(Make("w" + std::to_string(i) + ".wav", xmptest::media::Wav())),
                       ovraxmp::kXMP_WAVFile);
  }
  std::atomic<int> wrong{0};
  const auto opens = OpensDuring([&] {
    std::vector<std::thread> threads;
    for (int t = 0; t < 8; ++t) {
      threads.emplace_back([&, t] {
        for (int round = 0; round < 50; ++round) {
          for (std::size_t i = 0; i < files.size(); ++i) {
            const auto& [path, format] = files[(i + static_cast<std::size_t>(t)) % files.size()];
            if (GetXMPFormat(path) != format) ++wrong;
            // One thread keeps forgetting a path, so detection and lookups mix.
            if (t == 0 && round % 10 == 0) EraseCachedXMPFormat(files[0].first);
          }
        }
      });
    }
    for (std::thread& thread : threads) thread.join();
  });
  EXPECT_EQ(wrong.load(), 0);
  // Each file is opened at most once per thread, plus the forced re-detections.
  EXPECT_LE(opens, files.size() * 8 + 5 * 8);
  for (const auto& [path, format] : files) {
    const auto entry = detail::CachedXMPFormat(path);
    ASSERT_TRUE(entry);
    EXPECT_EQ(entry->format, format);
  }
}

TEST(AssociatedFiles, AMediaFileListsItselfThenItsSidecarAndAppends) {
  ovratest::TempDir dir;
  const fs::path file = dir / "shot.jpg";
  ovratest::WriteFile(file, xmptest::media::Jpeg());
  std::vector<std::u16string> files = {u"kept"};
  ASSERT_TRUE(GetAssociatedFiles(U16(file), files));
  ASSERT_GE(files.size(), 2u);
  EXPECT_EQ(files[0], u"kept");
  EXPECT_EQ(fs::path(ovracore::ToUTF8(files[1])).filename(), "shot.jpg");

  ovratest::WriteFile(dir / "shot.xmp", "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"/>");
  std::vector<std::u16string> withSidecar;
  ASSERT_TRUE(GetAssociatedFiles(U16(file), withSidecar));
  const bool hasSidecar =
      std::any_of(withSidecar.begin(), withSidecar.end(), [](const std::u16string& f) {
        return fs::path(ovracore::ToUTF8(f)).filename() == "shot.xmp";
      });
  EXPECT_TRUE(hasSidecar);
}

TEST(AssociatedFiles, AFileTheToolkitCannotHandleGivesFalse) {
  ovratest::TempDir dir;
  std::vector<std::u16string> files;
  bool result = true;
  EXPECT_NO_THROW(result = GetAssociatedFiles(U16(dir / "nothing-here.mov"), files));
  EXPECT_FALSE(result);
  EXPECT_TRUE(files.empty());
}

}  // namespace
