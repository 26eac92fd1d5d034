// Native metadata around a write: the file handlers merge EXIF, IPTC and
// QuickTime values into the XMP on read and write some back, and a library
// write must not lose any of them. ExifTool is the independent witness.
#include <algorithm>
#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "MediaFiles.h"
#include "ProviderTestSupport.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;

// ExifTool's "[group] tag : value" lines for the given tag selection.
std::vector<std::string> Lines(const fs::path& file, const std::string& selection) {
  std::istringstream out(ovratest::media::RunCommand("LC_ALL=C exiftool -G1 -a -s " + selection + " '" +
                                                     file.string() + "' 2>/dev/null"));
  std::vector<std::string> lines;
  for (std::string line; std::getline(out, line);) lines.push_back(line);
  return lines;
}

bool Has(const std::vector<std::string>& lines, const std::string& line) {
  return std::find(lines.begin(), lines.end(), line) != lines.end();
}

void EditText(const boost::shared_ptr<MetaDataProvider>& provider, const char* ns, const char* name,
              const std::string& value) {
  const Path path = PathForSchemaNameAndPropertyName(UTF8String(ns), name);
  MetaDataUpdateAccess access(provider);
  ASSERT_TRUE(SetValue(*access, path, UTF8String(value)));
  access.AddChange(path);
}

TEST(Reconciliation, WritingATitleToACameraJPEGKeepsEveryEXIFValue) {
  if (!ovratest::media::HaveExifTool()) GTEST_SKIP() << "exiftool is not installed";
  ovratest::TempDir dir;
  const fs::path file = dir / "camera.jpg";
  ovratest::WriteFile(file, ovratest::media::MinimalJPEG());
  ovratest::media::RunCommand(
      "LC_ALL=C exiftool -q -overwrite_original -Make=Canon '-Model=EOS 5D' -ExposureTime=1/125 -FNumber=5.6 "
      "-ISO=200 '-DateTimeOriginal=2024:05:01 10:20:30' '-Artist=Ana Lopez' -ImageDescription=Harbour "
      "'-Copyright=(c) Ana' '-Software=Cam 1.0' -GPSLatitude=48.5 -GPSLatitudeRef=N -IPTC:Keywords=sea '" +
      file.string() + "'");
  const std::vector<std::string> before = Lines(file, "-EXIF:all");
  ASSERT_GE(before.size(), 15u) << "ExifTool did not write the camera values";

  auto provider = ovratest::OpenFile(file);
  ASSERT_NE(provider->MetaDataAccess(), nullptr);  // merged from EXIF and IPTC: no XMP packet yet
  EXPECT_EQ(ovratest::Raw(provider->MetaDataAccess(), ovraxmp::kXMP_NS_TIFF, "Make"), "Canon");
  EditText(provider, ovraxmp::kXMP_NS_DC, "title", "Boats at dusk");

  const std::vector<std::string> after = Lines(file, "-EXIF:all");
  for (const std::string& line : before) EXPECT_TRUE(Has(after, line)) << "lost: " << line;
  EXPECT_EQ(ovratest::media::ExifToolValue(file, "XMP-dc:Title"), "Boats at dusk");
  // Native blocks are never written: the IPTC record stays as it was.
  EXPECT_EQ(ovratest::media::ExifToolValue(file, "IPTC:ObjectName"), "");
  EXPECT_EQ(ovratest::media::ExifToolValue(file, "IPTC:Keywords"), "sea");
}

TEST(Reconciliation, AnMP4KeepsEveryXMPValueExceptThoseTheHandlerDerives) {
  if (!ovratest::media::HaveExifTool()) GTEST_SKIP() << "exiftool is not installed";
  ovratest::TempDir dir;
  const fs::path file = dir / "clip.mp4";
  ovratest::WriteFile(file, ovratest::media::MinimalMP4());
  ovratest::media::RunCommand(
      "LC_ALL=C exiftool -q -overwrite_original -XMP-dc:Title=Clip -XMP-dc:Creator=Ana -XMP-xmp:Rating=4 "
      "-XMP-xmpDM:Scene=S1 -XMP-xmpDM:VideoFrameRate=25 -XMP-xmpDM:DurationValue=99 "
      "-XMP-xmpDM:DurationScale=0.001 -XMP-xmp:Label=Red '" + file.string() + "'");
  const std::vector<std::string> before = Lines(file, "-XMP:all");
  ASSERT_GE(before.size(), 7u) << "ExifTool did not write the XMP values";

  auto provider = ovratest::OpenFile(file);
  ASSERT_NE(provider->MetaDataAccess(), nullptr);
  EditText(provider, ovraxmp::kXMP_NS_DC, "description", "A clip");

  // Derived from the movie header: the duration (and, for a file with
  // creation times, xmp:CreateDate and xmp:ModifyDate).
  const std::vector<std::string> after = Lines(file, "-XMP:all");
  for (const std::string& line : before) {
    if (line.find("Duration") != std::string::npos || line.find("XMPToolkit") != std::string::npos) continue;
    EXPECT_TRUE(Has(after, line)) << "lost: " << line;
  }
  EXPECT_EQ(ovratest::media::ExifToolValue(file, "XMP-dc:Description"), "A clip");
}

}  // namespace
