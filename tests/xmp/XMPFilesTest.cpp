// The file part of the layer: what a read shows, what a write keeps, and
// hostile packets and files, each refused quickly, in bounded memory, in a
// child process (a crash fails the case, not the program), and never
// written.
#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include "../../xmp/src/files/Container.h"
#include "../../xmp/src/files/PacketScan.h"
#include "HostileInputs.h"
#include "XMPMediaFiles.h"
#include "XMPTestUtil.h"

using namespace ovraxmp;

namespace {

constexpr XMP_OptionBits kRead = kXMPFiles_OpenForRead | kXMPFiles_OpenAllowBackgroundFileOpen;
constexpr XMP_OptionBits kUpdate = kXMPFiles_OpenForUpdate | kXMPFiles_OpenAllowBackgroundFileOpen;

XMPMeta Read(const std::string& path) {
  XMPFiles file(path, kXMP_UnknownFile, kRead);
  XMPMeta meta;
  if (!file.GetXMP(&meta)) throw XMP_Error(kXMPErr_BadXMP, "<no XMP>: " + file.GetRefusal());
  return meta;
}

void Write(const std::string& path, const XMPMeta& meta) {
  XMPFiles file(path, kXMP_UnknownFile, kUpdate);
  file.PutXMP(meta);
  file.CloseFile();
}

std::string StoredFormat(const std::string& path) {
  try {
    return xmptest::Get(Read(path), kXMP_NS_DC, "format");
  } catch (const XMP_Error& e) {
    return e.GetErrMsg();
  }
}

void PutFormat(const std::string& path, const std::string& format) {
  XMPMeta meta = Read(path);
  meta.SetProperty(kXMP_NS_DC, "format", format);
  Write(path, meta);
}

std::string JpegWith(const std::string& packet) { return hostile::JpegWithPacket(xmptest::media::Jpeg(), packet); }

// Sanity caps, far above what a refusal costs (speed is measured in bench/).
void ExpectBoundedSuccess(const hostile::ChildResult& run, const std::string& what) {
  EXPECT_TRUE(run.exited) << what << ": the child died with signal " << -run.code;
  EXPECT_EQ(run.code, 0) << what;
  EXPECT_LT(run.seconds, 20) << what;
  EXPECT_LT(run.peakKB - hostile::CurrentRssKB(), 200 * 1024) << what;
}

TEST(XMPHostileInput, AbsurdPacketsAreRefusedQuietlyAsBadXMLOrXMPAndChangeNothing) {
  const std::pair<const char*, std::string (*)()> cases[] = {
      {"100,000 nested structures", [] { return hostile::DeepResources(100000); }},
      {"200,000 nested elements", [] { return hostile::DeepElements(200000); }},
      {"200,000 properties on one node", [] { return hostile::ManyProperties(200000); }},
      {"60,000 descriptions of one node", [] { return hostile::ManyDescriptions(60000); }},
      {"a bag of 60,000 items", [] { return hostile::BigBag(60000); }},
      {"billion laughs", hostile::BillionLaughs},
      {"invalid UTF-8", hostile::InvalidUTF8},
  };
  for (const auto& [name, make] : cases) {
    const std::string text = make();
    ExpectBoundedSuccess(hostile::RunIsolated([&] {
                           XMPMeta target;
                           target.SetProperty(kXMP_NS_XMP, "Label", "kept");
                           testing::internal::CaptureStderr();
                           const int id = xmptest::ErrorIdOf([&] { target.ParseFromBuffer(text); });
                           if (!testing::internal::GetCapturedStderr().empty()) return 2;
                           if (xmptest::Get(target, kXMP_NS_XMP, "Label") != "kept") return 3;
                           return id == kXMPErr_BadXML || id == kXMPErr_BadXMP ? 0 : 1;
                         }),
                         name);
  }
}

TEST(XMPHostileInput, BoundsSitExactlyAtTheirLimits) {
  const auto refused = [](const std::string& text) { return !detail::ScanPacket(text, nullptr); };
  // The head puts the properties at depth 4 (xmpmeta, RDF, Description, a).
  EXPECT_FALSE(refused(hostile::DeepElements(detail::kMaxNestingDepth - 4)));
  EXPECT_TRUE(refused(hostile::DeepElements(detail::kMaxNestingDepth - 3)));
  EXPECT_FALSE(refused(hostile::BigBag(detail::kMaxPropertiesPerNode)));
  EXPECT_TRUE(refused(hostile::BigBag(detail::kMaxPropertiesPerNode + 1)));
  // Attributes are properties too (rdf:parseType is the first), and the
  // descriptions of the one node add up.
  std::string attributes;
  for (std::uint32_t i = 1; i < detail::kMaxPropertiesPerNode; ++i) attributes += " xmp:a" + std::to_string(i) + "=\"v\"";
  EXPECT_FALSE(refused(hostile::Packet("<xmp:s rdf:parseType=\"Resource\"" + attributes + "/>")));
  EXPECT_TRUE(refused(hostile::Packet("<xmp:s rdf:parseType=\"Resource\"" + attributes + " xmp:b=\"v\"/>")));
  EXPECT_TRUE(refused(hostile::ManyDescriptions(detail::kMaxPropertiesPerNode + 1)));
  // Blank text is no packet (an empty buffer is an empty one).
  EXPECT_EQ(xmptest::ErrorIdOf([] { xmptest::Parse(" \n\t "); }), kXMPErr_BadXML);
}

struct FileCase {
  const char* name;
  const char* file;
  XMP_FileFormat format;
  std::string (*make)();
};

const FileCase kHostileFiles[] = {
    {"JPEG, XMP nested 1,500 levels", "deep.jpg", kXMP_JPEGFile, [] { return JpegWith(hostile::DeepResources(1500)); }},
    {"JPEG, Extended XMP nested 100,000 levels", "deep-ext.jpg", kXMP_JPEGFile,
     [] { return hostile::JpegWithExtendedXMP(xmptest::media::Jpeg(), hostile::DeepResources(100000)); }},
    {"JPEG, garbage XMP segment", "garbage.jpg", kXMP_JPEGFile,
     [] { return JpegWith(std::string("\x01\x02garbage<<<\xFF\xFE not XML")); }},
    {"JPEG, empty XMP segment", "empty.jpg", kXMP_JPEGFile, [] { return JpegWith(""); }},
    {"JPEG, well-formed XML that is not XMP", "notxmp.jpg", kXMP_JPEGFile,
     [] { return JpegWith(hostile::Wrapped(hostile::Packet("<rdf:li>misplaced</rdf:li>"))); }},
    {"JPEG, billion laughs", "laughs.jpg", kXMP_JPEGFile, [] { return JpegWith(hostile::BillionLaughs()); }},
    {"MP4, XMP nested 100,000 levels", "deep.mp4", kXMP_MPEG4File,
     [] { return xmptest::media::Mp4() + hostile::XMPBox(hostile::DeepResources(100000)); }},
    {"MP4, 20,000 nested udta boxes", "udta.mp4", kXMP_MPEG4File,
     [] { return hostile::Mp4WithNestedUdta(xmptest::media::Mp4(), 20000); }},
    {"MP4, broken moov size", "moov.mp4", kXMP_MPEG4File,
     [] {
       return hostile::WithBrokenBoxSize(
           xmptest::media::Mp4() + hostile::XMPBox(hostile::Packet("<dc:format>x</dc:format>")), "moov");
     }},
    {"WAV, 20,000 nested LIST chunks", "list.wav", kXMP_WAVFile,
     [] {
       std::string nested;
       for (int i = 0; i < 20000; ++i) nested = hostile::RiffChunk("LIST", "INFO" + nested);
       return hostile::WavWithChunk(xmptest::media::Wav(), nested);
     }},
    {"PNG, XMP nested 100,000 levels", "deep.png", kXMP_PNGFile,
     [] {
       const std::string png = xmptest::media::Png();
       const std::string itxt = xmptest::media::PngChunk(
           "iTXt", detail::PNGPacketKeyword() + std::string(5, '\0') + hostile::Wrapped(hostile::DeepResources(100000)));
       return png.substr(0, 33) + itxt + png.substr(33);
     }},
};

TEST(XMPHostileInput, HostileFilesReadAsWithoutXMPAndAreNeverWritten) {
  ovratest::TempDir dir;
  for (const FileCase& c : kHostileFiles) {
    const std::string path = (dir / c.file).string();
    const std::string bytes = c.make();
    ovratest::WriteFile(path, bytes);
    const auto run = hostile::RunIsolated([&] {
      testing::internal::CaptureStderr();  // the toolkit may name what it dropped
      XMPFiles file;
      if (!file.OpenFile(path, kXMP_UnknownFile, kRead)) return 1;
      XMPMeta meta;
      if (file.GetXMP(&meta)) return 2;
      if (file.GetRefusal().empty()) return 3;
      XMP_FileFormat format = 0;
      if (!file.GetFileInfo(nullptr, nullptr, &format) || format != c.format) return 4;
      file.CloseFile();
      XMPFiles update;
      if (update.OpenFile(path, kXMP_UnknownFile, kUpdate)) return 5;
      return 0;
    });
    ExpectBoundedSuccess(run, c.name);
    EXPECT_EQ(ovratest::ReadFile(path), bytes) << c.name;
  }
  // Minimal regression inputs, independent of the generators.
  int seen = 0;
  for (const auto& entry : std::filesystem::directory_iterator(ovratest::DataDir() / "hostile")) {
    ++seen;
    const std::string path = (dir / entry.path().filename()).string();
    std::filesystem::copy_file(entry.path(), path);
    const auto run = hostile::RunIsolated([&] {
      testing::internal::CaptureStderr();
      XMPFiles file(path, kXMP_UnknownFile, kRead), update;
      XMPMeta meta;
      return file.GetXMP(&meta) || update.OpenFile(path, kXMP_UnknownFile, kUpdate) ? 1 : 0;
    });
    ExpectBoundedSuccess(run, path);
    EXPECT_EQ(ovratest::ReadFile(path), ovratest::ReadFile(entry.path())) << path;
  }
  EXPECT_GE(seen, 8);
}

TEST(XMPHostileInput, APacketStartWithoutAnEndHungTheScan) {
  // Found by the fuzzer: the scan for an end marker stopped moving on.
  ovratest::TempDir dir;
  const std::string path = (dir / "endless.bin").string();
  std::filesystem::copy_file(ovratest::DataDir() / "regression" / "packet-without-end.bin", path);
  ExpectBoundedSuccess(hostile::RunIsolated([&] {
                         XMPFiles file(path, kXMP_UnknownFile, kRead);
                         XMPMeta meta;
                         return file.GetXMP(&meta) ? 1 : 0;
                       }, 5),
                       "packet without end");
}

TEST(XMPHostileInput, AWebPWithWaveChunksLeakedInTheToolkitsHandler) {
  // Found by the fuzzer (the leak shows under AddressSanitizer): the toolkit's
  // handler is not asked about a file whose layout the layer knows and
  // which holds neither XMP nor native metadata.
  ovratest::TempDir dir;
  const std::string path = (dir / "odd.webp").string();
  std::filesystem::copy_file(ovratest::DataDir() / "regression" / "webp-with-wave-chunks.webp", path);
  XMPFiles file(path, kXMP_UnknownFile, kRead);
  XMPMeta meta;
  EXPECT_FALSE(file.GetXMP(&meta));
}

TEST(XMPFiles, FilesOfTheSameShapesWithSanePacketsAreReadAndWritten) {
  ovratest::TempDir dir;
  const std::string packet = hostile::Packet("<dc:format>image/x-test</dc:format>");
  const std::pair<const char*, std::string> cases[] = {
      {"ok.jpg", JpegWith(hostile::Wrapped(packet))},
      {"ok.mp4", xmptest::media::Mp4() + hostile::XMPBox(hostile::Wrapped(packet))},
      {"udta.mp4", hostile::Mp4WithNestedUdta(xmptest::media::Mp4(), 3) + hostile::XMPBox(hostile::Wrapped(packet))},
      {"ok.wav", hostile::WavWithChunk(xmptest::media::Wav(), hostile::RiffChunk("_PMX", hostile::Wrapped(packet)))},
      {"none.tif", xmptest::media::Tiff()},
  };
  for (const auto& [name, bytes] : cases) {
    const std::string path = (dir / name).string();
    ovratest::WriteFile(path, bytes);
    if (StoredFormat(path) == "image/x-test") {
      PutFormat(path, "image/x-edited");
      EXPECT_EQ(StoredFormat(path), "image/x-edited") << name;
    } else {
      // A file without XMP gets a new packet.
      XMPMeta meta;
      meta.SetProperty(kXMP_NS_DC, "format", "image/x-new");
      Write(path, meta);
      EXPECT_EQ(StoredFormat(path), "image/x-new") << name;
    }
  }
  // A file whose structure the layer does not know is written only in a
  // packet of its own; without one it is refused and left alone.
  const std::string mp3 = (dir / "none.mp3").string();
  ovratest::WriteFile(mp3, xmptest::media::Mp3());
  XMPMeta fresh;
  fresh.SetProperty(kXMP_NS_DC, "format", "audio/x-new");
  EXPECT_EQ(xmptest::ErrorIdOf([&] { Write(mp3, fresh); }), kXMPErr_Unimplemented);
  EXPECT_EQ(ovratest::ReadFile(mp3), xmptest::media::Mp3());
}

TEST(XMPFiles, AReadShowsTheStoredPacketAndNativeValuesOnlyWhereItHasNone) {
  if (!xmptest::media::HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; it makes the file";
  ovratest::TempDir dir;
  const std::string path = (dir / "camera.jpg").string();
  ovratest::WriteFile(path, xmptest::media::Jpeg());
  xmptest::media::RunCommand("exiftool -q -overwrite_original -EXIF:Make=Native -EXIF:Model=Cam -XMP-tiff:Make=Stored '" +
                             path + "'");
  const XMPMeta meta = Read(path);
  EXPECT_EQ(xmptest::Get(meta, kXMP_NS_TIFF, "Make"), "Stored");
  EXPECT_EQ(xmptest::Get(meta, kXMP_NS_TIFF, "Model"), "Cam");
  // A write carries only the change: the native value stays out of the packet.
  XMPMeta edited = meta;
  edited.SetProperty(kXMP_NS_XMP, "Label", "Edited");
  Write(path, edited);
  EXPECT_EQ(xmptest::media::ExifToolValue(path, "XMP-tiff:Model"), "");
  EXPECT_EQ(xmptest::media::ExifToolValue(path, "XMP-xmp:Label"), "Edited");
}

TEST(XMPFiles, TheToolkitsTextOnADamagedExifBlockWasPrintedBare) {
  if (!xmptest::media::HaveExifTool()) GTEST_SKIP() << "ExifTool is missing; it makes the file";
  ovratest::TempDir dir;
  const std::string path = (dir / "damaged.jpg").string();
  ovratest::WriteFile(path, xmptest::media::Jpeg());
  xmptest::media::RunCommand("exiftool -q -overwrite_original -EXIF:Artist=Me -XMP-xmp:Label=Kept '" + path + "'");
  std::string bytes = ovratest::ReadFile(path);
  bytes.replace(bytes.find("Exif") + 6, 2, "XX");  // no TIFF byte order
  ovratest::WriteFile(path, bytes);
  testing::internal::CaptureStderr();
  XMPFiles file(path, kXMP_UnknownFile, kRead);
  XMPMeta meta;
  EXPECT_TRUE(file.GetXMP(&meta));
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_EQ(file.ToolkitNotes(), std::vector<std::string>{"Unrecognized TIFF prefix"});
  EXPECT_EQ(xmptest::Get(meta, kXMP_NS_XMP, "Label"), "Kept");
}

TEST(XMPFiles, EditsGoIntoThePacketStoredAtWriteTimeAndOtherPacketsRemoveNothing) {
  ovratest::TempDir dir;
  const std::string path = (dir / "shared.jpg").string();
  ovratest::WriteFile(path, JpegWith(hostile::Wrapped(hostile::Packet("<dc:format>a</dc:format>"))));
  // Two holders read the file, each changes another property.
  XMPMeta first = Read(path), second = Read(path);
  first.SetProperty(kXMP_NS_XMP, "Label", "First");
  second.SetProperty(kXMP_NS_XMP, "Rating", "2");
  second.DeleteProperty(kXMP_NS_DC, "format");
  Write(path, first);
  Write(path, second);
  XMPMeta now = Read(path);
  EXPECT_EQ(xmptest::Get(now, kXMP_NS_XMP, "Label"), "First");
  EXPECT_EQ(xmptest::Get(now, kXMP_NS_XMP, "Rating"), "2");
  EXPECT_FALSE(now.DoesPropertyExist(kXMP_NS_DC, "format"));
  // A packet that no file handed out adds its properties and removes none.
  XMPMeta fresh;
  fresh.SetProperty(kXMP_NS_XMP, "Label", "Fresh");
  Write(path, fresh);
  now = Read(path);
  EXPECT_EQ(xmptest::Get(now, kXMP_NS_XMP, "Label"), "Fresh");
  EXPECT_EQ(xmptest::Get(now, kXMP_NS_XMP, "Rating"), "2");
}

TEST(XMPFiles, AnEditKeepsEveryOtherByteOfThePacket) {
  // Forms a toolkit round trip would change: an alias beside its actual
  // property, an rdf:about, attributes, an unknown namespace, comments.
  const std::string kept =
      "<rdf:Description rdf:about=\"uuid:faf5bdd5\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
      "xmlns:tiff=\"http://ns.adobe.com/tiff/1.0/\" xmlns:x1=\"http://example.org/unknown/\" "
      "xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\" xmp:Rating=\"3\" x1:Shade=\"blue\">\n"
      "  <!-- made by hand -->\n  <tiff:Artist>Old Artist</tiff:Artist>\n"
      "  <dc:creator><rdf:Seq><rdf:li>Ana</rdf:li></rdf:Seq></dc:creator>\n";
  const std::string text = "<?xpacket begin=\"\xEF\xBB\xBF\" id=\"W5M0MpCehiHzreSzNTczkc9d\"?>\n"
                           "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF "
                           "xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">" +
                           kept + " </rdf:Description></rdf:RDF></x:xmpmeta>\n" + std::string(400, ' ') +
                           "\n<?xpacket end=\"w\"?>";
  ovratest::TempDir dir;
  const std::string path = (dir / "hand.xmp").string();
  ovratest::WriteFile(path, text);
  XMPMeta meta = Read(path);
  meta.SetProperty(kXMP_NS_XMP, "Label", "Blue");
  meta.SetProperty(kXMP_NS_XMP, "Rating", "4");
  Write(path, meta);
  const std::string written = ovratest::ReadFile(path);
  std::string expected = kept;
  expected.replace(expected.find(" xmp:Rating=\"3\""), 15, "");
  EXPECT_NE(written.find(expected), std::string::npos) << written;
  EXPECT_NE(written.find("<xmp:Rating>4</xmp:Rating>"), std::string::npos) << written;
  EXPECT_NE(written.find("<xmp:Label>Blue</xmp:Label>"), std::string::npos) << written;
}

TEST(XMPFiles, AnUnreadableStoredPacketIsNeverReplaced) {
  ovratest::TempDir dir;
  const std::string path = (dir / "bad.jpg").string();
  const std::string bytes = JpegWith(hostile::Wrapped(
      hostile::Packet("<dc:format>kept</dc:format><dc:title><rdf:Bag><rdf:Alt/></rdf:Bag></dc:title>")));
  ovratest::WriteFile(path, bytes);
  testing::internal::CaptureStderr();
  EXPECT_EQ(StoredFormat(path).rfind("<no XMP>", 0), 0u);
  XMPMeta fresh;
  fresh.SetProperty(kXMP_NS_XMP, "Label", "Lost?");
  EXPECT_THROW(Write(path, fresh), XMP_Error);
  testing::internal::GetCapturedStderr();
  EXPECT_EQ(ovratest::ReadFile(path), bytes);
}

TEST(XMPFiles, RelativePathsAndLinksReachTheFileTheyName) {
  ovratest::TempDir dir;
  std::filesystem::create_directories(dir / "c");
  ovratest::WriteFile(dir / "c" / "x.jpg", JpegWith(hostile::Wrapped(hostile::Packet("<dc:format>rel</dc:format>"))));
  std::filesystem::create_symlink("c/x.jpg", dir / "link.jpg");
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(dir.path());
  const XMP_FileFormat format = XMPFiles::CheckFileFormat("c/x.jpg");
  const std::string value = StoredFormat("./c/../c/x.jpg");
  PutFormat("link.jpg", "rel2");
  std::filesystem::current_path(before);
  EXPECT_EQ(format, kXMP_JPEGFile);
  EXPECT_EQ(value, "rel");
  EXPECT_TRUE(std::filesystem::is_symlink(dir / "link.jpg"));
  EXPECT_EQ(StoredFormat((dir / "c" / "x.jpg").string()), "rel2");
}

}  // namespace
