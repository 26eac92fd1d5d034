// FormatValue dispatch, fallback paths and the constructed camera properties,
// on real packets with the built-in definitions loaded.
#include <string>

#include <gtest/gtest.h>

#include <ovraxmp/XMPMeta.h>

#include "MetadataTestSupport.h"
#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

using ovratest::PathOf;

constexpr char kTestNS[] = "http://ns.ovrametadata.org/test/format/1.0/";

// Properties whose types drive the dispatch by type id.
const char kTestDefinitions[] = R"(<xmp_definitions>
  <xmp_type name="FormatTestPair">
    <xmp_field namespace="http://ns.ovrametadata.org/test/format/1.0/" prefix="fmtTest" name="First" type="text"/>
  </xmp_type>
  <xmp_schema namespace="http://ns.ovrametadata.org/test/format/1.0/" prefix="fmtTest">
    <xmp_property name="Ratio" type="rational"/>
    <xmp_property name="Where" type="gpscoordinate"/>
    <xmp_property name="When" type="date"/>
    <xmp_property name="Note" type="text"/>
    <xmp_property name="Count" type="integer"/>
    <xmp_property name="Pair" type="FormatTestPair"/>
  </xmp_schema>
</xmp_definitions>)";

// A packet with the given rdf:Description content; the prefixes exif,
// exifEX, aux and tiff are declared.
ovraxmp::XMPMeta Packet(const std::string& properties) {
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(std::string(R"(<rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">)") +
                       R"(<rdf:Description rdf:about="" xmlns:exif=")" + kNamespace_Exif + R"(" xmlns:exifEX=")" +
                       kNamespace_ExifEX + R"(" xmlns:aux=")" + kNamespace_ExifAUX + R"(" xmlns:tiff=")" +
                       kNamespace_Tiff + R"(">)" + properties + "</rdf:Description></rdf:RDF>");
  return meta;
}

class FormatRegistry : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    ovratest::InitializeWithDefinitions(kTestDefinitions, kTestNS);
    // Start-up registers them already; registering again only replaces.
    RegisterBuiltInFormatters();
  }
  static void TearDownTestSuite() {
    ClearFormatterTables();
    Terminate();
  }
  void TearDown() override { RegisterValueFormatter(ValueFormatterFn()); }
};

TEST_F(FormatRegistry, EveryBuiltInFormatterAnswersForItsPath) {
  const struct {
    const char* ns;
    const char* name;
    const char* raw;
    const char* expected;
  } cases[] = {
      {kNamespace_Exif, "ExposureTime", "1/256", "1/250 sec"},
      {kNamespace_Exif, "ShutterSpeedValue", "8/1", "1/250 sec"},
      {kNamespace_Exif, "FNumber", "28/10", "2.8"},
      {kNamespace_Exif, "ApertureValue", "5/1", "5.7"},
      {kNamespace_Exif, "MaxApertureValue", "3/1", "2.8"},
      {kNamespace_Exif, "SubjectDistance", "4294967295/1", "\xE2\x88\x9E"},
      {kNamespace_ExifAUX, "ApproximateFocusDistance", "1234/1000", "1.23"},
  };
  for (const auto& c : cases) EXPECT_EQ(c.expected, FormatValue(nullptr, PathOf(c.ns, c.name), c.raw)) << c.name;
}

TEST_F(FormatRegistry, ApplicationFormatterWinsOnlyWithANonEmptyText) {
  UTF8String seenRaw;
  RegisterValueFormatter([&](XMPMetaRef, const Path& path, const UTF8String& raw) {
    seenRaw = raw;
    return path.entry_name == "FNumber" ? UTF8String() : UTF8String("host text");
  });
  EXPECT_EQ("2.8", FormatValue(nullptr, PathOf(kNamespace_Exif, "FNumber"), "28/10"));
  EXPECT_EQ("28/10", seenRaw);
  EXPECT_EQ("host text", FormatValue(nullptr, PathOf(kNamespace_Exif, "ExposureTime"), "1/250"));
  EXPECT_EQ("host text", FormatValue(nullptr, PathOf(kTestNS, "Note"), "x"));

  EXPECT_TRUE(RegisteredValueFormatter());
  RegisterValueFormatter(ValueFormatterFn());
  EXPECT_FALSE(RegisteredValueFormatter());
  EXPECT_EQ("1/250 sec", FormatValue(nullptr, PathOf(kNamespace_Exif, "ExposureTime"), "1/250"));
}

TEST_F(FormatRegistry, DefinitionTypeSelectsTheFormatter) {
  const struct {
    const char* name;
    const char* raw;
    std::string expected;
  } cases[] = {
      {"Ratio", "1/3", "0.33"},
      {"Ratio", "1/0", ""},
      {"Where", "37,46.5N", FormatGPSCoordinate("37,46.5N")},
      {"When", "2024-01-05T15:04:05Z", FormatDate("2024-01-05T15:04:05Z")},
      // Other types and structures have no display form.
      {"Note", "1/3", ""},
      {"Count", "1/3", ""},
      {"Pair", "1/3", ""},
  };
  for (const auto& c : cases) EXPECT_EQ(c.expected, FormatValue(nullptr, PathOf(kTestNS, c.name), c.raw)) << c.name;
  EXPECT_FALSE(FormatGPSCoordinate("37,46.5N").empty());
  EXPECT_FALSE(FormatDate("2024-01-05T15:04:05Z").empty());
  EXPECT_EQ("", FormatValue(nullptr, Path(), "1/3"));
}

// The prefixed name of a property of the built-in schemas, e.g. "tiff:Orientation".
struct Named {
  const char* ns;
  const char* name;
};

struct ConstructCase {
  const char* what;
  Named path;
  std::string packet;
  Named mixed;  // marked multi-valued when set
  bool ok;
  const char* value;  // "untouched" when nothing is constructed
  boost::optional<GetValueResult> result;  // none: not checked
};

void ExpectConstructed(const ConstructCase& c) {
  SCOPED_TRACE(c.what);
  ovraxmp::XMPMeta meta = Packet(c.packet);
  if (c.mixed.ns) meta.SetMultiValued(c.mixed.ns, PathOf(c.mixed.ns, c.mixed.name).description);
  const Path path = PathOf(c.path.ns, c.path.name);
  UTF8String value = "untouched";
  GetValueResult result = ValueFound;
  EXPECT_EQ(GetConstructedValue(meta.GetInternalRef(), path, value, &result), c.ok);
  EXPECT_EQ(value, c.value);
  if (c.result) {
    EXPECT_EQ(result, *c.result);
  }
  if (c.ok) {
    // A text read of the absent property constructs it as well.
    UTF8String read;
    EXPECT_TRUE(GetValue(meta.GetInternalRef(), path, read));
    EXPECT_EQ(read, c.value);
  }
}

TEST_F(FormatRegistry, NewerPropertiesFallBackToTheirOlderTwinsOneWayOnly) {
  const std::string packet =
      "<aux:Lens>24-70mm</aux:Lens><aux:SerialNumber>B-1</aux:SerialNumber>"
      "<aux:LensSerialNumber>L-2</aux:LensSerialNumber><aux:OwnerName>Kim</aux:OwnerName>"
      "<exifEX:GPSHPositioningError>5/1</exifEX:GPSHPositioningError>";
  const std::string reverse =
      "<exifEX:LensModel>50mm</exifEX:LensModel><exif:GPSHPositioningError>7/1</exif:GPSHPositioningError>";
  const ConstructCase cases[] = {
      {"lens model", {kNamespace_ExifEX, "LensModel"}, packet, {}, true, "24-70mm", ValueFound},
      {"body serial", {kNamespace_ExifEX, "BodySerialNumber"}, packet, {}, true, "B-1", ValueFound},
      {"lens serial", {kNamespace_ExifEX, "LensSerialNumber"}, packet, {}, true, "L-2", ValueFound},
      {"owner", {kNamespace_ExifEX, "CameraOwnerName"}, packet, {}, true, "Kim", ValueFound},
      // Internal rationals come formatted by the text read.
      {"positioning error", {kNamespace_Exif, "GPSHPositioningError"}, packet, {}, true, "5.00", ValueFound},
      {"no way back", {kNamespace_ExifAUX, "Lens"}, reverse, {}, false, "untouched", {}},
      {"no way back 2", {kNamespace_ExifEX, "GPSHPositioningError"}, reverse, {}, false, "untouched", {}},
      {"fallback absent", {kNamespace_ExifEX, "BodySerialNumber"}, reverse, {}, false, "untouched", ValueAbsent},
      {"no entry", {kTestNS, "Note"}, packet, {}, false, "untouched", {}},
  };
  for (const auto& c : cases) ExpectConstructed(c);

  UTF8String value = "untouched";
  EXPECT_FALSE(GetConstructedValue(Packet(packet).GetInternalRef(), Path(), value, nullptr));
  GetValueResult result = ValueFound;
  EXPECT_FALSE(GetConstructedValue(nullptr, PathOf(kNamespace_ExifEX, "CameraOwnerName"), value, &result));
  EXPECT_EQ(ValueAbsent, result);
  EXPECT_EQ("untouched", value);
}

TEST_F(FormatRegistry, ImageSizeFollowsTheOrientation) {
  const std::string exif =
      "<exif:PixelXDimension>4000</exif:PixelXDimension><exif:PixelYDimension>3000</exif:PixelYDimension>"
      "<tiff:ImageWidth>10</tiff:ImageWidth><tiff:ImageLength>20</tiff:ImageLength>";
  const Named size{kNamespace_OrlexAggregate, "ImageSize"};
  ExpectConstructed({"no orientation", size, exif, {}, true, "4000 x 3000", ValueFound});
  // Only 5 to 8 turn the image by a quarter.
  for (const char* orientation : {"1", "2", "3", "4", "5", "6", "7", "8", "9"}) {
    const bool rotated = orientation[0] >= '5' && orientation[0] <= '8';
    ExpectConstructed({orientation, size, exif + "<tiff:Orientation>" + orientation + "</tiff:Orientation>", {},
                       true, rotated ? "3000 x 4000" : "4000 x 3000", ValueFound});
  }
}

TEST_F(FormatRegistry, ConstructedCameraProperties) {
  const Named size{kNamespace_OrlexAggregate, "ImageSize"};
  const Named resolution{kNamespace_OrlexAggregate, "ImageResolution"};
  const Named shutter{kNamespace_OrlexAggregate, "ShutterSpeed"};
  const std::string pixels =
      "<exif:PixelXDimension>4000</exif:PixelXDimension><exif:PixelYDimension>3000</exif:PixelYDimension>"
      "<tiff:Orientation>6</tiff:Orientation>";
  const std::string xy = "<tiff:XResolution>300/1</tiff:XResolution><tiff:YResolution>200/1</tiff:YResolution>";
  const ConstructCase cases[] = {
      // One EXIF dimension alone is not enough.
      {"tiff dimensions", size,
       "<exif:PixelXDimension>4000</exif:PixelXDimension><tiff:ImageWidth>640</tiff:ImageWidth>"
       "<tiff:ImageLength>480</tiff:ImageLength><tiff:Orientation>6</tiff:Orientation>",
       {}, true, "480 x 640", ValueFound},
      {"one dimension", size, "<tiff:ImageWidth>640</tiff:ImageWidth>", {}, false, "untouched", ValueAbsent},
      {"mixed orientation", size, pixels, {kNamespace_Tiff, "Orientation"}, false, "untouched", ValueMixed},
      // Internal rationals are read formatted.
      {"equal resolutions", resolution,
       "<tiff:XResolution>300/1</tiff:XResolution><tiff:YResolution>300/1</tiff:YResolution>", {}, true, "300.00",
       ValueFound},
      {"differing resolutions", resolution, xy, {}, true, "300.00 x 200.00", ValueFound},
      {"rotated resolutions", resolution, xy + "<tiff:Orientation>8</tiff:Orientation>", {}, true,
       "200.00 x 300.00", ValueFound},
      {"no horizontal resolution", resolution, "<tiff:YResolution>200/1</tiff:YResolution>", {}, false,
       "untouched", ValueAbsent},
      {"mixed vertical resolution", resolution, xy, {kNamespace_Tiff, "YResolution"}, false, "untouched",
       ValueMixed},
      // The APEX value wins over the exposure time.
      {"apex and time", shutter,
       "<exif:ShutterSpeedValue>6/1</exif:ShutterSpeedValue><exif:ExposureTime>1/250</exif:ExposureTime>", {},
       true, "1/60 sec", ValueFound},
      {"time only", shutter, "<exif:ExposureTime>1/250</exif:ExposureTime>", {}, true, "1/250 sec", ValueFound},
      {"no shutter", shutter, "", {}, false, "untouched", ValueAbsent},
  };
  for (const auto& c : cases) ExpectConstructed(c);
}

std::string Sensitivity(int value, const char* type) {
  std::string xml =
      "<exif:ISOSpeedRatings><rdf:Seq><rdf:li>12800</rdf:li><rdf:li>100</rdf:li></rdf:Seq></exif:ISOSpeedRatings>";
  if (value >= 0)
    xml += "<exifEX:PhotographicSensitivity>" + std::to_string(value) + "</exifEX:PhotographicSensitivity>";
  if (type) xml += std::string("<exifEX:SensitivityType>") + type + "</exifEX:SensitivityType>";
  return xml;
}

TEST_F(FormatRegistry, SensitivityPrefixFollowsTheSensitivityType) {
  const Named iso{kNamespace_OrlexAggregate, "PhotographicSensitivity"};
  const ConstructCase cases[] = {
      {"ratings only", iso, Sensitivity(-1, nullptr), {}, true, "ISO 12800", ValueFound},
      {"400 type 2", iso, Sensitivity(400, "2"), {}, true, "ISO 12800", ValueFound},
      {"type 1", iso, Sensitivity(65535, "1"), {}, true, "SOS 12800", ValueFound},
      {"type 2", iso, Sensitivity(65535, "2"), {}, true, "REI 12800", ValueFound},
      {"type 3", iso, Sensitivity(65535, "3"), {}, true, "ISO 12800", ValueFound},
      {"type 4", iso, Sensitivity(65535, "4"), {}, true, "SOS 12800", ValueFound},
      {"no type", iso, Sensitivity(65535, nullptr), {}, true, "ISO 12800", ValueFound},
      // It needs a rating and a single sensitivity.
      {"no rating", iso, "<exifEX:PhotographicSensitivity>400</exifEX:PhotographicSensitivity>", {}, false,
       "untouched", ValueAbsent},
      {"mixed sensitivity", iso, Sensitivity(400, nullptr), {kNamespace_ExifEX, "PhotographicSensitivity"}, false,
       "untouched", ValueMixed},
  };
  for (const auto& c : cases) ExpectConstructed(c);
}

}  // namespace
}  // namespace ovrametadata
