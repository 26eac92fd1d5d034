// Reading and writing the XMP of small media files and of .xmp sidecars,
// and the interoperability with an independent reader and writer.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "XMPMediaFiles.h"
#include "XMPTestUtil.h"

using namespace ovraxmp;
using xmptest::Get;

namespace {

struct MediaCase {
  const char* file;
  XMP_FileFormat format;
  std::string (*make)();
};

const MediaCase kMedia[] = {
    {"tiny.jpg", kXMP_JPEGFile, xmptest::media::Jpeg}, {"tiny.png", kXMP_PNGFile, xmptest::media::Png},
    {"tiny.tif", kXMP_TIFFFile, xmptest::media::Tiff}, {"tiny.mp4", kXMP_MPEG4File, xmptest::media::Mp4},
    {"tiny.wav", kXMP_WAVFile, xmptest::media::Wav},   {"tiny.mp3", kXMP_MP3File, xmptest::media::Mp3},
};

constexpr XMP_OptionBits kRead = kXMPFiles_OpenForRead | kXMPFiles_OpenAllowBackgroundFileOpen;      // 0x401
constexpr XMP_OptionBits kUpdate = kXMPFiles_OpenForUpdate | kXMPFiles_OpenAllowBackgroundFileOpen;  // 0x402
constexpr XMP_OptionBits kDetect = 0x4A5;

XMPMeta ReadBack(const std::string& path) {
  XMPMeta meta;
  XMPFiles file(path, kXMP_UnknownFile, kRead);
  EXPECT_TRUE(file.GetXMP(&meta));
  return meta;
}

void WriteSample(const std::string& path) {
  XMPFiles file;
  ASSERT_TRUE(file.OpenFile(path, kXMP_UnknownFile, kUpdate));
  XMPMeta meta;
  file.GetXMP(&meta);
  meta.SetLocalizedText(kXMP_NS_DC, "title", "", "x-default", "Tiny sample");
  meta.AppendArrayItem(kXMP_NS_DC, "subject", kXMP_PropValueIsArray, "alpha");
  meta.AppendArrayItem(kXMP_NS_DC, "subject", 0, "beta; gamma");
  meta.SetProperty_Int(kXMP_NS_XMP, "Rating", 3);
  meta.SetProperty(kXMP_NS_Transient, "MultiFileCount", "2");
  meta.SetMultiValued(kXMP_NS_XMP, "Rating");
  ASSERT_TRUE(file.CanPutXMP(meta));
  file.PutXMP(meta);
  file.CloseFile();
}

}  // namespace

TEST(XMPFiles, EachMediaFormatIsDetectedWrittenAndReadBack) {
  ovratest::TempDir dir;
  for (const MediaCase& media : kMedia) {
    SCOPED_TRACE(media.file);
    const std::string path = (dir / media.file).string();
    ovratest::WriteFile(path, media.make());
    EXPECT_EQ(XMPFiles::CheckFileFormat(path), media.format);
    WriteSample(path);
    const XMPMeta back = ReadBack(path);
    std::string lang, title;
    EXPECT_TRUE(back.GetLocalizedText(kXMP_NS_DC, "title", "", "x-default", &lang, &title));
    EXPECT_EQ(title, "Tiny sample");
    EXPECT_EQ(back.CountArrayItems(kXMP_NS_DC, "subject"), 2);
    EXPECT_EQ(Get(back, kXMP_NS_DC, "subject[2]"), "beta; gamma");
    EXPECT_EQ(Get(back, kXMP_NS_XMP, "Rating"), "3");
    EXPECT_FALSE(back.DoesPropertyExist(kXMP_NS_Transient, "MultiFileCount"));  // never written
    EXPECT_FALSE(back.IsMultiValued(kXMP_NS_XMP, "Rating"));                    // marks stay in memory
    EXPECT_EQ(ovratest::ReadFile(path).find("transient"), std::string::npos);

    XMPFiles file(path, kXMP_UnknownFile, kDetect);
    std::string infoPath;
    XMP_OptionBits openFlags = 0, handlerFlags = 0;
    XMP_FileFormat format = 0;
    ASSERT_TRUE(file.GetFileInfo(&infoPath, &openFlags, &format, &handlerFlags));
    EXPECT_EQ(infoPath, path);
    EXPECT_EQ(format, media.format);
    EXPECT_EQ(openFlags, kDetect);
    XMP_OptionBits formatFlags = 0;
    EXPECT_TRUE(XMPFiles::GetFormatInfo(media.format, &formatFlags));
    EXPECT_NE(formatFlags & kXMPFiles_CanInjectXMP, 0u);
    EXPECT_FALSE(file.CanPutXMP(back));  // opened for reading
    EXPECT_THROW(file.PutXMP(back), XMP_Error);
    file.CloseFile();
    EXPECT_FALSE(file.GetFileInfo());
  }
}

TEST(XMPFiles, FileWithoutXmpAnswersFalseAndReadOnlyCloseWritesNothing) {
  ovratest::TempDir dir;
  const std::string path = (dir / "plain.png").string();
  const std::string bytes = xmptest::media::Png();
  ovratest::WriteFile(path, bytes);
  XMPMeta meta;
  meta.SetProperty(kXMP_NS_XMP, "Label", "before");
  XMPFiles file(path, kXMP_UnknownFile, kRead);
  EXPECT_FALSE(file.GetXMP(&meta));
  file.CloseFile();
  EXPECT_EQ(ovratest::ReadFile(path), bytes);
  XMPFiles update(path, kXMP_UnknownFile, kUpdate);
  update.CloseFile();  // nothing put: the file stays as it was
  EXPECT_EQ(ovratest::ReadFile(path), bytes);
}

TEST(XMPFiles, FilesThatCannotBeOpenedRaiseOrAnswerFalseQuietly) {
  ovratest::TempDir dir;
  const std::string garbage = (dir / "garbage.bin").string();
  ovratest::WriteFile(garbage, std::string(300, '\x17'));
  testing::internal::CaptureStderr();
  XMPFiles file;
  EXPECT_FALSE(file.OpenFile((dir / "missing.jpg").string(), kXMP_UnknownFile, kRead));
  EXPECT_FALSE(file.OpenFile(garbage, kXMP_UnknownFile, kDetect));
  EXPECT_FALSE(file.OpenFile((dir / "").string(), kXMP_UnknownFile, kRead));  // a folder
  EXPECT_EQ(XMPFiles::CheckFileFormat(garbage), kXMP_UnknownFile);
  EXPECT_EQ(XMPFiles::CheckFileFormat((dir / "missing.jpg").string()), kXMP_UnknownFile);
  try {
    XMPFiles opened((dir / "missing.jpg").string(), kXMP_UnknownFile, kRead);
    ADD_FAILURE() << "opened a missing file";
  } catch (const XMP_Error& e) {
    EXPECT_STREQ(e.GetErrMsg(), "OpenFile returned false");
  }
  std::vector<std::string> resources;
  EXPECT_FALSE(XMPFiles::GetAssociatedResources((dir / "missing.jpg").string(), &resources));
  EXPECT_TRUE(resources.empty());
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_THROW(file.GetXMP(nullptr), XMP_Error);  // not open
}

TEST(XMPFiles, SidecarWorksLikeAMediaFile) {
  ovratest::TempDir dir;
  const std::string media = (dir / "clip.mp4").string();
  const std::string sidecar = (dir / "clip.xmp").string();
  ovratest::WriteFile(media, xmptest::media::Mp4());
  std::vector<std::string> resources;
  ASSERT_TRUE(XMPFiles::GetAssociatedResources(media, &resources, kXMP_UnknownFile, 0x408));
  EXPECT_EQ(resources, std::vector<std::string>{media});
  ovratest::WriteFile(sidecar, xmptest::RealWorldPacket());
  resources.clear();
  ASSERT_TRUE(XMPFiles::GetAssociatedResources(media, &resources, kXMP_UnknownFile, 0x408));
  EXPECT_EQ(resources, (std::vector<std::string>{media, sidecar}));
  EXPECT_EQ(XMPFiles::CheckFileFormat(sidecar), kXMP_XMLFile);

  {
    XMPFiles file(sidecar, kXMP_UnknownFile, kUpdate);
    XMPMeta meta;
    ASSERT_TRUE(file.GetXMP(&meta));
    EXPECT_EQ(Get(meta, kXMP_NS_XMP, "Label"), "Select");
    meta.SetProperty(kXMP_NS_XMP, "Label", "Rejected");
    meta.SetProperty(kXMP_NS_Transient, "MultiFileCount", "2");
    EXPECT_TRUE(file.CanPutXMP(meta));
    file.PutXMP(meta);
    EXPECT_EQ(Get(xmptest::Parse(ovratest::ReadFile(sidecar)), kXMP_NS_XMP, "Label"), "Select");  // not before close
    file.CloseFile();
  }
  const XMPMeta back = ReadBack(sidecar);
  EXPECT_EQ(Get(back, kXMP_NS_XMP, "Label"), "Rejected");
  EXPECT_EQ(Get(back, kXMP_NS_DC, "creator[1]"), "Ana Müller");
  EXPECT_EQ(ovratest::ReadFile(sidecar).find("MultiFileCount"), std::string::npos);
  // The sidecar keeps its own name; no temporary file is left behind.
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir.path()), std::filesystem::directory_iterator()), 2);
  ovratest::WriteFile(sidecar, "  \n");
  XMPFiles empty(sidecar, kXMP_UnknownFile, kRead);
  XMPMeta none;
  EXPECT_FALSE(empty.GetXMP(&none));
}

TEST(XMPFilesInterop, ExifToolReadsWhatTheLayerWritesAndTheReverse) {
  if (!xmptest::media::HaveExifTool()) GTEST_SKIP() << "exiftool is not installed; interoperability not checked";
  ovratest::TempDir dir;
  const std::string jpeg = (dir / "ours.jpg").string();
  ovratest::WriteFile(jpeg, xmptest::media::Jpeg());
  WriteSample(jpeg);
  const std::string seen = xmptest::media::RunCommand("LC_ALL=C exiftool -s -s -s -XMP-dc:Title -XMP-dc:Subject -XMP-xmp:Rating '" + jpeg + "'");
  EXPECT_EQ(seen, "Tiny sample\nalpha, beta; gamma\n3\n");

  const std::string png = (dir / "theirs.png").string();
  ovratest::WriteFile(png, xmptest::media::Png());
  const std::string written = xmptest::media::RunCommand("LC_ALL=C exiftool -q -overwrite_original -XMP-dc:Creator='Zoë Writer' "
                                    "-XMP-dc:Creator='Second' -XMP-xmp:Label=Approved '" + png + "' 2>&1");
  EXPECT_EQ(written, "");
  const XMPMeta back = ReadBack(png);
  EXPECT_EQ(back.CountArrayItems(kXMP_NS_DC, "creator"), 2);
  EXPECT_EQ(Get(back, kXMP_NS_DC, "creator[1]"), "Zoë Writer");
  EXPECT_EQ(Get(back, kXMP_NS_XMP, "Label"), "Approved");
}
