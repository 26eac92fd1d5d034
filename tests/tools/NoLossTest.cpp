// Writes change exactly what was asked: ovrameta edits files made the way
// cameras and other tools make them (tests/data/media), and ExifTool reads
// every tag before and after. Only the edited property, the edit history
// and what follows from the file's new size may differ; ffmpeg checks that
// the media itself decodes to the same frames.
#include "ToolTestSupport.h"

namespace {

using namespace ovratest::tool;
using nlohmann::json;

const std::string kLong(4000, 'x');

struct Edit {
  const char* fault;  // what the write used to damage
  std::vector<std::string> files;
  std::vector<std::string> arguments;
  std::map<std::string, std::string> changed;  // tag -> value after; "" when gone
};

class NoLoss : public ToolTest, public ::testing::WithParamInterface<Edit> {};

TEST_P(NoLoss, OnlyTheEditedPropertyAndTheHistoryChange) {
  if (!HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; writes are not compared";
  const Edit& edit = GetParam();
  std::vector<fs::path> files;
  std::vector<std::string> digests;
  for (const std::string& name : edit.files) {
    files.push_back(Medium(name));
    if (HaveFFmpeg()) digests.push_back(DecodedDigest(files.back()));
  }
  const std::vector<json> before = ExifToolTags(files);

  std::vector<std::string> arguments = {"set"};
  arguments.insert(arguments.end(), edit.files.begin(), edit.files.end());
  arguments.insert(arguments.end(), edit.arguments.begin(), edit.arguments.end());
  const Result result = Run(arguments);
  ASSERT_EQ(result.status, 0) << result.err;

  const std::vector<json> after = ExifToolTags(files);
  for (std::size_t i = 0; i < files.size(); ++i) {
    ExpectOnlyChanged(before[i], after[i], edit.changed, edit.files[i]);
    if (!digests.empty()) {
      EXPECT_EQ(DecodedDigest(files[i]), digests[i]) << edit.files[i] << ": media changed";
    }
  }
}

const std::vector<std::string> kEveryContainer = {"exif-dates.jpg", "iptc.tif",  "layers.psd",
                                                  "packet.png",     "timecode.mp4", "timecode.mov",
                                                  "info.wav",       "id3.mp3",   "three-languages.xmp"};

INSTANTIATE_TEST_SUITE_P(
    Media, NoLoss,
    ::testing::Values(
        Edit{"OtherLanguagesWereOverwrittenWithTheDefault",
             {"lang-iptc-digest.jpg", "lang-iptc-nodigest.jpg", "three-languages.xmp"},
             {"xmp:Label=Blue"},
             {{"XMP-xmp:Label", "Blue"}}},
        Edit{"ADefaultTitleEditRewroteIPTCAndEXIF",
             {"lang-iptc-digest.jpg", "lang-iptc-nodigest.jpg"},
             {"dc:title=New title"},
             {{"XMP-dc:Title", "New title"}}},
        Edit{"CameraDataOnlyInXMPWasDeleted", {"xmp-camera.jpg"}, {"xmp:Label=Blue"}, {{"XMP-xmp:Label", "Blue"}}},
        Edit{"EXIFDatesLostTheirSecondsOrWereReplaced",
             {"exif-dates.jpg"},
             {"xmp:CreateDate=2024-05-01"},
             {{"XMP-xmp:CreateDate", "2024:05:01"}}},
        Edit{"FlashFocalPlaneCopyrightFlagAndAboutDisappeared",
             {"iptc.tif", "layers.psd"},
             {"xmp:Label=Blue"},
             {{"XMP-xmp:Label", "Blue"}}},
        Edit{"TimecodesChangedAndEmptyMovieDatesBecame1904",
             {"timecode.mp4", "timecode.mov"},
             {"xmp:Label=Blue"},
             {{"XMP-xmp:Label", "Blue"}}},
        Edit{"RIFFInfoAndID3WereRewritten", {"info.wav", "id3.mp3"}, {"xmp:Label=Blue"}, {{"XMP-xmp:Label", "Blue"}}},
        Edit{"EveryContainerMakesRoomForALargerPacket",
             kEveryContainer,
             {"dc:description=" + kLong},
             {{"XMP-dc:Description", kLong}}},
        Edit{"APacketLargerThanAJPEGSegmentWasRefused",
             {"member-b.jpg"},
             {"dc:description=" + std::string(40000, 'y'), "dc:rights=" + std::string(40000, 'z')},
             {{"XMP-dc:Description", std::string(40000, 'y')}, {"XMP-dc:Rights", std::string(40000, 'z')}}},
        Edit{"APNGPacketThatShrinks", {"packet.png"}, {"--delete", "dc:description"}, {{"XMP-dc:Description", ""}}},
        Edit{"AThreeFileEditMergedWhatDiffers",
             {"member-a.jpg", "member-b.jpg", "member-c.jpg"},
             {"dc:rights=CC BY 4.0"},
             {{"XMP-dc:Rights", "CC BY 4.0"}}},
        Edit{"ValuesSetWereNotTheValuesStored",
             {"lang-iptc-digest.jpg"},
             {"exif:FNumber=2.8", "exif:GPSLatitude=48.8584", "exif:GPSLongitude=2 17 40.2 E"},
             {{"XMP-exif:FNumber", "2.8"},
              {"XMP-exif:GPSLatitude", "48 deg 51' 30.24\" N"},
              {"XMP-exif:GPSLongitude", "2 deg 17' 40.20\" E"}}}),
    [](const ::testing::TestParamInfo<Edit>& info) { return std::string(info.param.fault); });

using WriteRegression = ToolTest;

TEST_F(WriteRegression, CameraDataOnlyInXMPWasNotShown) {
  Medium("xmp-camera.jpg");
  ExpectValues({{"xmp-camera.jpg", "tiff:Make", "Orlex"},
                {"xmp-camera.jpg", "exif:ExposureTime", "1/250 sec"},
                {"xmp-camera.jpg", "exif:FNumber", "5.6"},
                {"xmp-camera.jpg", "exif:Flash/exif:Fired", "Fired"}});
}

TEST_F(WriteRegression, ValuesSetWereNotTheValuesRead) {
  Medium("lang-iptc-digest.jpg");
  ASSERT_EQ(Run({"set", "lang-iptc-digest.jpg", "exif:FNumber=2.8", "exif:GPSLatitude=48.8584",
                 "xmp:ModifyDate=2024:05:01 14:30:00"})
                .status,
            0);
  ExpectValues({{"lang-iptc-digest.jpg", "exif:FNumber", "2.8"},
                {"lang-iptc-digest.jpg", "exif:GPSLatitude", "48\xC2\xB0 51' 30.24\" N"}});
  EXPECT_EQ(Run({"get", "--raw", "lang-iptc-digest.jpg", "xmp:ModifyDate"}).out,
            "2024-05-01T14:30\n");
  const Result refused = Run({"set", "lang-iptc-digest.jpg", "exif:GPSLatitude=north"});
  EXPECT_EQ(refused.status, 2);
  ExpectContains(refused.err, {"48 51 30.2 N"});
}

TEST_F(WriteRegression, ExtendedXMPWrittenByExifToolWasLost) {
  if (!HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; it makes the file";
  const fs::path file = Medium("member-c.jpg");
  const std::string big(90000, 'w');
  RunCommand("exiftool -q -overwrite_original '-XMP-dc:Description=" + big + "' " + Quote(file.string()));
  const auto before = ExifToolTags({file});
  ASSERT_TRUE(before[0].contains("XMP-xmpNote:HasExtendedXMP")) << "ExifTool wrote no Extended XMP";
  EXPECT_EQ(Get(file, "dc:description"), big);
  ASSERT_EQ(Run({"set", "member-c.jpg", "xmp:Label=Blue", "dc:title=Short"}).status, 0);
  ExpectOnlyChanged(before[0], ExifToolTags({file})[0], {{"XMP-xmp:Label", "Blue"}, {"XMP-dc:Title", "Short"}},
                    "member-c.jpg");
}

TEST_F(WriteRegression, EmptyMovieHeaderDatesWereShownAs1904) {
  Medium("timecode.mp4");
  EXPECT_EQ(Run({"get", "timecode.mp4", "xmp:CreateDate"}).status, 1);
}

TEST_F(WriteRegression, APartialEditWroteTheValuesBeforeTheBadOne) {
  const fs::path file = Medium("packet.png");
  const std::string before = ReadFile(file);
  const Result result = Run({"set", "packet.png", "xmp:Label=Partial", "dc:subject[9]=x"});
  EXPECT_EQ(result.status, 2);
  ExpectContains(result.err, {"dc:subject[9] does not exist", "nothing was written"});
  EXPECT_EQ(ReadFile(file), before);
}

}  // namespace
