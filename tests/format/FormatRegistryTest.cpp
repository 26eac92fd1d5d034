// FormatValue dispatch, fallback paths and the constructed camera properties,
// on real packets with the built-in definitions loaded.
#include <string>

#include <gtest/gtest.h>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovraxmp/XMPMeta.h>

#include "format/FormatInternal.h"

namespace ovrametadata {
namespace {

constexpr char kTestNS[] = "http://ns.ovrametadata.org/test/format/1.0/";

// Properties whose types drive the dispatch by type id.
const char kTestDefinitions[] = R"(<?xml version="1.0" encoding="UTF-8"?>
<xmp_definitions>
  <xmp_type name="FormatTestPair" label="Pair" description="Two texts.">
    <xmp_field namespace="http://ns.ovrametadata.org/test/format/1.0/" prefix="fmtTest"
               name="First" type="text" label="First" description="First."/>
  </xmp_type>
  <xmp_schema namespace="http://ns.ovrametadata.org/test/format/1.0/" prefix="fmtTest"
              label="Format test" description="Format test.">
    <xmp_property name="Ratio" type="rational" label="Ratio" description="Ratio."/>
    <xmp_property name="Where" type="gpscoordinate" label="Where" description="Where."/>
    <xmp_property name="When" type="date" label="When" description="When."/>
    <xmp_property name="Note" type="text" label="Note" description="Note."/>
    <xmp_property name="Count" type="integer" label="Count" description="Count."/>
    <xmp_property name="Pair" type="FormatTestPair" label="Pair" description="Pair."/>
  </xmp_schema>
</xmp_definitions>
)";

Path P(const char* ns, const char* name) {
  return PathForSchemaNameAndPropertyName(UTF8String(ns), UTF8String(name));
}

// A packet with the given rdf:Description content; the prefixes exif,
// exifEX, aux and tiff are declared.
ovraxmp::XMPMeta Packet(const std::string& properties) {
  const std::string rdf =
      std::string(R"(<rdf:RDF xmlns:rdf="http://www.w3.org/1999/02/22-rdf-syntax-ns#">)") +
      R"(<rdf:Description rdf:about="" xmlns:exif=")" + kNamespace_Exif +
      R"(" xmlns:exifEX=")" + kNamespace_ExifEX + R"(" xmlns:aux=")" + kNamespace_ExifAUX +
      R"(" xmlns:tiff=")" + kNamespace_Tiff + R"(">)" + properties +
      "</rdf:Description></rdf:RDF>";
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(rdf);
  return meta;
}

class FormatRegistry : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    Initialize();
    ParseBufferAndRegisterDefinitions(kTestDefinitions, u"format-test", false);
    // Start-up registers them already; registering again only replaces.
    RegisterBuiltInFormatters();
  }
  static void TearDownTestSuite() {
    ClearFormatterTables();
    Terminate();
  }
  void SetUp() override {
    for (const char* ns : {kNamespace_Exif, kNamespace_ExifEX, kNamespace_ExifAUX,
                           kNamespace_Tiff, kNamespace_OrlexAggregate, kTestNS}) {
      if (!NamespaceDefinition(ns)) GTEST_SKIP() << "no definitions for " << ns;
    }
  }
  void TearDown() override { RegisterValueFormatter(ValueFormatterFn()); }
};

// ---------------------------------------------------------------------------
// FormatValue

TEST_F(FormatRegistry, EveryBuiltInFormatterAnswersForItsPath) {
  struct Case {
    const char* ns;
    const char* name;
    const char* raw;
    const char* expected;
  };
  const Case cases[] = {
      {kNamespace_Exif, "ExposureTime", "1/256", "1/250 sec"},
      {kNamespace_Exif, "ShutterSpeedValue", "8/1", "1/250 sec"},
      {kNamespace_Exif, "FNumber", "28/10", "2.8"},
      {kNamespace_Exif, "ApertureValue", "5/1", "5.7"},
      {kNamespace_Exif, "MaxApertureValue", "3/1", "2.8"},
      {kNamespace_Exif, "SubjectDistance", "4294967295/1", "\xE2\x88\x9E"},
      {kNamespace_ExifAUX, "ApproximateFocusDistance", "1234/1000", "1.23"},
  };
  for (const Case& c : cases) {
    const Path path = P(c.ns, c.name);
    ASSERT_FALSE(path.description.empty()) << c.name;
    EXPECT_EQ(c.expected, FormatValue(nullptr, path, c.raw)) << c.name;
  }
}

TEST_F(FormatRegistry, ApplicationFormatterWinsOnlyWithANonEmptyText) {
  const Path fNumber = P(kNamespace_Exif, "FNumber");
  UTF8String seenRaw;
  RegisterValueFormatter([&](XMPMetaRef, const Path& path, const UTF8String& raw) {
    seenRaw = raw;
    return path.entry_name == "FNumber" ? UTF8String() : UTF8String("host text");
  });
  EXPECT_EQ("2.8", FormatValue(nullptr, fNumber, "28/10"));
  EXPECT_EQ("28/10", seenRaw);
  EXPECT_EQ("host text", FormatValue(nullptr, P(kNamespace_Exif, "ExposureTime"), "1/250"));
  EXPECT_EQ("host text", FormatValue(nullptr, P(kTestNS, "Note"), "x"));

  EXPECT_TRUE(RegisteredValueFormatter());
  RegisterValueFormatter(ValueFormatterFn());
  EXPECT_FALSE(RegisteredValueFormatter());
  EXPECT_EQ("1/250 sec", FormatValue(nullptr, P(kNamespace_Exif, "ExposureTime"), "1/250"));
}

TEST_F(FormatRegistry, DefinitionTypeSelectsTheFormatter) {
  EXPECT_EQ("0.33", FormatValue(nullptr, P(kTestNS, "Ratio"), "1/3"));
  EXPECT_EQ("", FormatValue(nullptr, P(kTestNS, "Ratio"), "1/0"));
  EXPECT_EQ(FormatGPSCoordinate("37,46.5N"), FormatValue(nullptr, P(kTestNS, "Where"), "37,46.5N"));
  EXPECT_FALSE(FormatValue(nullptr, P(kTestNS, "Where"), "37,46.5N").empty());
  EXPECT_EQ(FormatDate("2024-01-05T15:04:05Z"),
            FormatValue(nullptr, P(kTestNS, "When"), "2024-01-05T15:04:05Z"));
  EXPECT_FALSE(FormatValue(nullptr, P(kTestNS, "When"), "2024-01-05T15:04:05Z").empty());
  // Other types, structures and unknown paths have no display form.
  EXPECT_EQ("", FormatValue(nullptr, P(kTestNS, "Note"), "1/3"));
  EXPECT_EQ("", FormatValue(nullptr, P(kTestNS, "Count"), "1/3"));
  EXPECT_EQ("", FormatValue(nullptr, P(kTestNS, "Pair"), "1/3"));
  EXPECT_EQ("", FormatValue(nullptr, Path(), "1/3"));
}

// ---------------------------------------------------------------------------
// Fallback paths

TEST_F(FormatRegistry, NewerPropertiesFallBackToTheirOlderTwins) {
  ovraxmp::XMPMeta meta = Packet(
      "<aux:Lens>24-70mm</aux:Lens><aux:SerialNumber>B-1</aux:SerialNumber>"
      "<aux:LensSerialNumber>L-2</aux:LensSerialNumber><aux:OwnerName>Kim</aux:OwnerName>"
      "<exifEX:GPSHPositioningError>5/1</exifEX:GPSHPositioningError>");
  const struct {
    const char* ns;
    const char* name;
    const char* expected;
  } cases[] = {
      {kNamespace_ExifEX, "LensModel", "24-70mm"},
      {kNamespace_ExifEX, "BodySerialNumber", "B-1"},
      {kNamespace_ExifEX, "LensSerialNumber", "L-2"},
      {kNamespace_ExifEX, "CameraOwnerName", "Kim"},
      // Internal rationals come formatted by the text read.
      {kNamespace_Exif, "GPSHPositioningError", "5.00"},
  };
  for (const auto& c : cases) {
    UTF8String value = "untouched";
    GetValueResult result = ValueError;
    EXPECT_TRUE(GetConstructedValue(meta.GetInternalRef(), P(c.ns, c.name), value, &result))
        << c.name;
    EXPECT_EQ(c.expected, value) << c.name;
    EXPECT_EQ(ValueFound, result) << c.name;
  }
}

TEST_F(FormatRegistry, NothingConstructedWithoutAUsableEntry) {
  // Fallbacks go one way only; a missing fallback value or packet gives
  // nothing; paths without any entry give nothing.
  ovraxmp::XMPMeta meta = Packet(
      "<exifEX:LensModel>50mm</exifEX:LensModel><aux:OwnerName>Kim</aux:OwnerName>"
      "<exif:GPSHPositioningError>7/1</exif:GPSHPositioningError>");
  const Path paths[] = {P(kNamespace_ExifAUX, "Lens"), P(kNamespace_ExifEX, "GPSHPositioningError"),
                        P(kNamespace_ExifEX, "BodySerialNumber"), P(kTestNS, "Note"), Path()};
  for (const Path& path : paths) {
    UTF8String value = "untouched";
    EXPECT_FALSE(GetConstructedValue(meta.GetInternalRef(), path, value, nullptr)) << path.description;
    EXPECT_EQ("untouched", value);
  }
  UTF8String value = "untouched";
  GetValueResult result = ValueFound;
  EXPECT_FALSE(GetConstructedValue(nullptr, P(kNamespace_ExifEX, "CameraOwnerName"), value, &result));
  EXPECT_EQ(ValueAbsent, result);
  EXPECT_EQ("untouched", value);
}

// ---------------------------------------------------------------------------
// Constructed camera properties

struct Constructed {
  bool ok = false;
  UTF8String value;
  GetValueResult result = ValueFound;
};

Constructed Construct(const ovraxmp::XMPMeta& meta, const char* name) {
  Constructed c;
  c.value = "untouched";
  c.ok = GetConstructedValue(meta.GetInternalRef(), P(kNamespace_OrlexAggregate, name), c.value,
                             &c.result);
  return c;
}

TEST_F(FormatRegistry, ImageSizeFollowsTheOrientation) {
  const std::string exif =
      "<exif:PixelXDimension>4000</exif:PixelXDimension>"
      "<exif:PixelYDimension>3000</exif:PixelYDimension>"
      "<tiff:ImageWidth>10</tiff:ImageWidth><tiff:ImageLength>20</tiff:ImageLength>";
  const Constructed plain = Construct(Packet(exif), "ImageSize");
  EXPECT_TRUE(plain.ok);
  EXPECT_EQ("4000 x 3000", plain.value);
  EXPECT_EQ(ValueFound, plain.result);
  // Only 5 to 8 turn the image by a quarter.
  for (const char* orientation : {"1", "2", "3", "4", "5", "6", "7", "8", "9"}) {
    const bool rotated = orientation[0] >= '5' && orientation[0] <= '8';
    EXPECT_EQ(rotated ? "3000 x 4000" : "4000 x 3000",
              Construct(Packet(exif + "<tiff:Orientation>" + orientation + "</tiff:Orientation>"),
                        "ImageSize")
                  .value)
        << orientation;
  }
}

TEST_F(FormatRegistry, ImageSizeFallsBackToTiffDimensions) {
  // One EXIF dimension alone is not enough.
  Constructed c = Construct(Packet("<exif:PixelXDimension>4000</exif:PixelXDimension>"
                                   "<tiff:ImageWidth>640</tiff:ImageWidth>"
                                   "<tiff:ImageLength>480</tiff:ImageLength>"
                                   "<tiff:Orientation>6</tiff:Orientation>"),
                            "ImageSize");
  EXPECT_TRUE(c.ok);
  EXPECT_EQ("480 x 640", c.value);

  c = Construct(Packet("<tiff:ImageWidth>640</tiff:ImageWidth>"), "ImageSize");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ("untouched", c.value);
  EXPECT_EQ(ValueAbsent, c.result);
}

TEST_F(FormatRegistry, ImageSizeRefusesAMultiValuedOrientation) {
  ovraxmp::XMPMeta meta = Packet(
      "<exif:PixelXDimension>4000</exif:PixelXDimension>"
      "<exif:PixelYDimension>3000</exif:PixelYDimension>"
      "<tiff:Orientation>6</tiff:Orientation>");
  meta.SetMultiValued(kNamespace_Tiff, P(kNamespace_Tiff, "Orientation").description);
  const Constructed c = Construct(meta, "ImageSize");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ("untouched", c.value);
  EXPECT_EQ(ValueMixed, c.result);
}

TEST_F(FormatRegistry, ImageResolutionShowsOneValueWhenBothAreEqual) {
  Constructed c = Construct(Packet("<tiff:XResolution>300/1</tiff:XResolution>"
                                   "<tiff:YResolution>300/1</tiff:YResolution>"),
                            "ImageResolution");
  EXPECT_TRUE(c.ok);
  EXPECT_EQ("300.00", c.value);  // internal rationals are read formatted

  c = Construct(Packet("<tiff:XResolution>300/1</tiff:XResolution>"
                       "<tiff:YResolution>200/1</tiff:YResolution>"),
                "ImageResolution");
  EXPECT_EQ("300.00 x 200.00", c.value);

  c = Construct(Packet("<tiff:XResolution>300/1</tiff:XResolution>"
                       "<tiff:YResolution>200/1</tiff:YResolution>"
                       "<tiff:Orientation>8</tiff:Orientation>"),
                "ImageResolution");
  EXPECT_EQ("200.00 x 300.00", c.value);
}

TEST_F(FormatRegistry, ImageResolutionNeedsTheHorizontalValue) {
  Constructed c = Construct(Packet("<tiff:YResolution>200/1</tiff:YResolution>"),
                            "ImageResolution");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ(ValueAbsent, c.result);

  ovraxmp::XMPMeta meta = Packet("<tiff:XResolution>300/1</tiff:XResolution>"
                                 "<tiff:YResolution>200/1</tiff:YResolution>");
  meta.SetMultiValued(kNamespace_Tiff, P(kNamespace_Tiff, "YResolution").description);
  c = Construct(meta, "ImageResolution");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ(ValueMixed, c.result);
}

TEST_F(FormatRegistry, ShutterSpeedPrefersTheApexValue) {
  UTF8String apex;
  UTF8String exposure;
  ovraxmp::XMPMeta both = Packet("<exif:ShutterSpeedValue>6/1</exif:ShutterSpeedValue>"
                                 "<exif:ExposureTime>1/250</exif:ExposureTime>");
  ASSERT_TRUE(GetValue(both.GetInternalRef(), P(kNamespace_Exif, "ShutterSpeedValue"), apex));
  ASSERT_TRUE(GetValue(both.GetInternalRef(), P(kNamespace_Exif, "ExposureTime"), exposure));
  ASSERT_NE(apex, exposure);

  Constructed c = Construct(both, "ShutterSpeed");
  EXPECT_TRUE(c.ok);
  EXPECT_EQ(apex, c.value);

  c = Construct(Packet("<exif:ExposureTime>1/250</exif:ExposureTime>"), "ShutterSpeed");
  EXPECT_TRUE(c.ok);
  EXPECT_EQ(exposure, c.value);

  c = Construct(Packet(""), "ShutterSpeed");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ(ValueAbsent, c.result);
}

std::string Sensitivity(int value, const char* type) {
  std::string xml = "<exif:ISOSpeedRatings><rdf:Seq><rdf:li>12800</rdf:li><rdf:li>100</rdf:li>"
                    "</rdf:Seq></exif:ISOSpeedRatings>";
  if (value >= 0)
    xml += "<exifEX:PhotographicSensitivity>" + std::to_string(value) +
           "</exifEX:PhotographicSensitivity>";
  if (type) xml += std::string("<exifEX:SensitivityType>") + type + "</exifEX:SensitivityType>";
  return xml;
}

TEST_F(FormatRegistry, SensitivityPrefixFollowsTheSensitivityType) {
  const struct {
    int sensitivity;
    const char* type;
    const char* expected;
  } cases[] = {{-1, nullptr, "ISO 12800"},   {400, "2", "ISO 12800"},
               {65535, "1", "SOS 12800"},    {65535, "2", "REI 12800"},
               {65535, "3", "ISO 12800"},    {65535, "4", "SOS 12800"},
               {65535, nullptr, "ISO 12800"}};
  for (const auto& c : cases) {
    EXPECT_EQ(c.expected,
              Construct(Packet(Sensitivity(c.sensitivity, c.type)), "PhotographicSensitivity").value)
        << c.sensitivity << " " << (c.type ? c.type : "-");
  }
}

TEST_F(FormatRegistry, SensitivityNeedsARatingAndASingleSensitivity) {
  Constructed c = Construct(
      Packet("<exifEX:PhotographicSensitivity>400</exifEX:PhotographicSensitivity>"),
      "PhotographicSensitivity");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ("untouched", c.value);

  ovraxmp::XMPMeta meta = Packet(Sensitivity(400, nullptr));
  meta.SetMultiValued(kNamespace_ExifEX,
                      P(kNamespace_ExifEX, "PhotographicSensitivity").description);
  c = Construct(meta, "PhotographicSensitivity");
  EXPECT_FALSE(c.ok);
  EXPECT_EQ(ValueMixed, c.result);
  EXPECT_EQ("untouched", c.value);
}

TEST_F(FormatRegistry, TextReadOfAnAbsentConstructedPropertyConstructsIt) {
  ovraxmp::XMPMeta meta = Packet(
      "<exif:PixelXDimension>4000</exif:PixelXDimension>"
      "<exif:PixelYDimension>3000</exif:PixelYDimension>"
      "<tiff:Orientation>6</tiff:Orientation>");
  UTF8String value;
  GetValueResult result = ValueError;
  EXPECT_TRUE(GetValue(meta.GetInternalRef(), P(kNamespace_OrlexAggregate, "ImageSize"), value,
                       &result));
  EXPECT_EQ("3000 x 4000", value);
}

}  // namespace
}  // namespace ovrametadata
