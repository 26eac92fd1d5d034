// Hostile packets and media files: each is refused with a clear error or
// read as a file without XMP, quickly and in bounded memory, and no file is
// changed. Every case runs in a child process so that a crash inside the
// toolkit fails the case instead of the program.
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include "../../xmp/src/XMPScan.h"
#include "HostileInputs.h"
#include "XMPMediaFiles.h"
#include "XMPTestUtil.h"

using namespace ovraxmp;

namespace {

constexpr XMP_OptionBits kRead = kXMPFiles_OpenForRead | kXMPFiles_OpenAllowBackgroundFileOpen;
constexpr XMP_OptionBits kUpdate = kXMPFiles_OpenForUpdate | kXMPFiles_OpenAllowBackgroundFileOpen;

// Sets dc:format in a file through an update open.
void PutFormat(const std::string& path, const std::string& format) {
  XMPFiles file(path, kXMP_UnknownFile, kUpdate);
  XMPMeta meta;
  file.GetXMP(&meta);
  meta.SetProperty(kXMP_NS_DC, "format", format);
  file.PutXMP(meta);
  file.CloseFile();
}

// The stored dc:format, "<no XMP>" when the file holds none the toolkit reads.
std::string StoredFormat(const std::string& path) {
  XMPFiles file(path, kXMP_UnknownFile, kRead);
  XMPMeta meta;
  if (!file.GetXMP(&meta)) return "<no XMP>: " + file.GetRefusal();
  return xmptest::Get(meta, kXMP_NS_DC, "format");
}

// The keyword of the PNG text chunk that carries XMP, taken from a file the
// toolkit itself wrote, so that the hostile chunk is one the handler reads.
std::string PngXMPKeyword() {
  ovratest::TempDir dir;
  const std::string path = (dir / "keyword.png").string();
  ovratest::WriteFile(path, xmptest::media::Png());
  PutFormat(path, "image/png");
  const std::string bytes = ovratest::ReadFile(path);
  const std::size_t start = bytes.find("iTXt") + 4;
  return bytes.substr(start, bytes.find('\0', start) - start);
}

// Sanity caps, far above what a refusal costs (speed is measured in bench/).
constexpr double kMaxSeconds = 20;
constexpr long kMaxExtraKB = 200 * 1024;

void ExpectBoundedSuccess(const hostile::ChildResult& run, const std::string& what) {
  EXPECT_TRUE(run.exited) << what << ": the child died with signal " << -run.code;
  EXPECT_EQ(run.code, 0) << what;
  EXPECT_LT(run.seconds, kMaxSeconds) << what;
  EXPECT_LT(run.peakKB - hostile::CurrentRssKB(), kMaxExtraKB) << what;
}

// 0 when parsing raises kXMPErr_BadXML.
int ParseIsRefused(const std::string& text) {
  const std::int32_t id = xmptest::ErrorIdOf([&] { xmptest::Parse(text); });
  return id == kXMPErr_BadXML ? 0 : 1;
}

struct BufferCase {
  const char* name;
  std::string (*make)();
};

TEST(XMPHostileInput, AbsurdPacketsAreRefusedAsBadXML) {
  const BufferCase cases[] = {
      {"100,000 nested structures", [] { return hostile::DeepResources(100000); }},
      {"200,000 nested elements", [] { return hostile::DeepElements(200000); }},
      {"200,000 properties on one node", [] { return hostile::ManyProperties(200000); }},
      {"60,000 descriptions of one node", [] { return hostile::ManyDescriptions(60000); }},
      {"a bag of 60,000 items", [] { return hostile::BigBag(60000); }},
      {"billion laughs", hostile::BillionLaughs},
      {"invalid UTF-8", hostile::InvalidUTF8},
      {"a packet nested 10,000 levels", [] { return hostile::DeepResources(10000); }},
  };
  for (const BufferCase& c : cases) {
    const std::string text = c.make();
    ExpectBoundedSuccess(hostile::RunIsolated([&] { return ParseIsRefused(text); }), c.name);
  }
}

TEST(XMPHostileInput, BoundsSitExactlyAtTheirLimits) {
  // Both passes: the quick one that buffers get and the expat one.
  const auto refused = [](const std::string& text) {
    detail::PacketScanner scan;
    const bool byExpat = !scan.Feed(text.data(), text.size(), true);
    const bool quick = xmptest::ErrorIdOf([&] { detail::RequireSanePacket(text.data(), text.size()); }) != 0;
    EXPECT_EQ(byExpat, quick) << text.substr(0, 200);
    return byExpat;
  };
  // The head puts the properties at depth 4 (xmpmeta, RDF, Description, a).
  EXPECT_FALSE(refused(hostile::DeepElements(detail::kMaxNestingDepth - 4)));
  EXPECT_TRUE(refused(hostile::DeepElements(detail::kMaxNestingDepth - 3)));
  EXPECT_FALSE(refused(hostile::BigBag(detail::kMaxPropertiesPerNode)));
  EXPECT_TRUE(refused(hostile::BigBag(detail::kMaxPropertiesPerNode + 1)));
  // Attributes are properties too, and descriptions of the node add up.
  std::string attributes;
  // rdf:parseType is the first attribute.
  for (std::uint32_t i = 1; i < detail::kMaxPropertiesPerNode; ++i) attributes += " xmp:a" + std::to_string(i) + "=\"v\"";
  EXPECT_FALSE(refused(hostile::Packet("<xmp:s rdf:parseType=\"Resource\"" + attributes + "/>")));
  EXPECT_TRUE(refused(hostile::Packet("<xmp:s rdf:parseType=\"Resource\"" + attributes + " xmp:b=\"v\"/>")));
  EXPECT_TRUE(refused(hostile::ManyDescriptions(detail::kMaxPropertiesPerNode + 1)));

  detail::PacketScanner scan;
  const std::string chunk(1 << 20, ' ');
  bool accepted = scan.Feed("<a>", 3, false);
  for (std::uint64_t fed = 3; accepted && fed <= detail::kMaxPacketBytes; fed += chunk.size())
    accepted = scan.Feed(chunk.data(), chunk.size(), false);
  EXPECT_FALSE(accepted);
  EXPECT_NE(scan.Problem().find("larger than 256 MB"), std::string::npos) << scan.Problem();
}

TEST(XMPHostileInput, RealPacketsAreParsedAsBefore) {
  // A large real-world shape: a 2,400-item bag and 1,000 history events.
  std::string history;
  for (int i = 0; i < 1000; ++i)
    history += "<rdf:li rdf:parseType=\"Resource\"><stEvt:action>saved</stEvt:action><stEvt:instanceID>xmp.iid:" +
               std::to_string(i) + "</stEvt:instanceID><stEvt:when>2024-01-01T10:00:00Z</stEvt:when>"
               "<stEvt:softwareAgent>Editor 1.0</stEvt:softwareAgent><stEvt:changed>/metadata</stEvt:changed>"
               "</rdf:li>";
  std::string keywords;
  for (int i = 0; i < 2400; ++i) keywords += "<rdf:li>keyword number " + std::to_string(i) + "</rdf:li>";
  const std::string text = hostile::Packet(
      "<dc:subject><rdf:Bag>" + keywords + "</rdf:Bag></dc:subject>"
      "<xmpMM:History xmlns:xmpMM=\"http://ns.adobe.com/xap/1.0/mm/\" "
      "xmlns:stEvt=\"http://ns.adobe.com/xap/1.0/sType/ResourceEvent#\"><rdf:Seq>" + history +
      "</rdf:Seq></xmpMM:History>");
  const XMPMeta meta = xmptest::Parse(text);
  EXPECT_EQ(meta.CountArrayItems(kXMP_NS_DC, "subject"), 2400);
  EXPECT_EQ(meta.CountArrayItems("http://ns.adobe.com/xap/1.0/mm/", "History"), 1000);
  EXPECT_NO_THROW(xmptest::Parse(hostile::DeepResources(500)));
  // Blank text is no packet (an empty buffer is an empty one).
  EXPECT_EQ(xmptest::ErrorIdOf([] { xmptest::Parse(" \n\t "); }), kXMPErr_BadXML);
}

// ---- Media files ----

struct FileCase {
  const char* name;
  const char* file;
  XMP_FileFormat format;
  std::string (*make)();
};

std::string Jpeg() { return xmptest::media::Jpeg(); }
std::string Mp4() { return xmptest::media::Mp4(); }
std::string Wav() { return xmptest::media::Wav(); }

std::string JpegWith(const std::string& packet) { return hostile::JpegWithPacket(Jpeg(), packet); }

const FileCase kHostileFiles[] = {
    {"JPEG, XMP nested 1,500 levels", "deep.jpg", kXMP_JPEGFile, [] { return JpegWith(hostile::DeepResources(1500)); }},
    {"JPEG, Extended XMP nested 100,000 levels (4 MB)", "deep-ext.jpg", kXMP_JPEGFile,
     [] { return hostile::JpegWithExtendedXMP(Jpeg(), hostile::DeepResources(100000)); }},
    {"JPEG, Extended XMP with 200,000 properties", "many-ext.jpg", kXMP_JPEGFile,
     [] { return hostile::JpegWithExtendedXMP(Jpeg(), hostile::ManyProperties(200000)); }},
    {"JPEG, garbage XMP segment", "garbage.jpg", kXMP_JPEGFile,
     [] { return JpegWith(std::string("\x01\x02garbage<<<\xFF\xFE not XML")); }},
    {"JPEG, empty XMP segment", "empty.jpg", kXMP_JPEGFile, [] { return JpegWith(""); }},
    {"JPEG, invalid UTF-8 in a value", "latin1.jpg", kXMP_JPEGFile, [] { return JpegWith(hostile::InvalidUTF8()); }},
    {"JPEG, billion laughs", "laughs.jpg", kXMP_JPEGFile, [] { return JpegWith(hostile::BillionLaughs()); }},
    {"MP4, XMP nested 100,000 levels", "deep.mp4", kXMP_MPEG4File,
     [] { return Mp4() + hostile::XMPBox(hostile::DeepResources(100000)); }},
    {"MP4, 20,000 nested udta boxes", "udta.mp4", kXMP_MPEG4File,
     [] { return hostile::Mp4WithNestedUdta(Mp4(), 20000); }},
    {"MP4, broken moov size", "moov.mp4", kXMP_MPEG4File,
     [] { return hostile::WithBrokenBoxSize(Mp4() + hostile::XMPBox(hostile::Packet("<dc:format>x</dc:format>")), "moov"); }},
    {"MP4, empty XMP box", "empty.mp4", kXMP_MPEG4File, [] { return Mp4() + hostile::XMPBox(""); }},
    {"WAV, XMP nested 100,000 levels", "deep.wav", kXMP_WAVFile,
     [] { return hostile::WavWithChunk(Wav(), hostile::RiffChunk("_PMX", hostile::DeepResources(100000))); }},
    {"WAV, 20,000 nested LIST chunks", "list.wav", kXMP_WAVFile,
     [] {
       std::string nested;
       for (int i = 0; i < 20000; ++i) nested = hostile::RiffChunk("LIST", "INFO" + nested);
       return hostile::WavWithChunk(Wav(), nested);
     }},
    {"PNG, XMP nested 100,000 levels", "deep.png", kXMP_PNGFile,
     [] {
       const std::string png = xmptest::media::Png();
       const std::string itxt = xmptest::media::PngChunk(
           "iTXt", PngXMPKeyword() + std::string(5, '\0') + hostile::Wrapped(hostile::DeepResources(100000)));
       return png.substr(0, 33) + itxt + png.substr(33);
     }},
};

TEST(XMPHostileInput, HostileFilesOpenWithoutXMPAndStayUntouched) {
  ovratest::TempDir dir;
  for (const FileCase& c : kHostileFiles) {
    const std::string path = (dir / c.file).string();
    const std::string bytes = c.make();
    ovratest::WriteFile(path, bytes);
    const auto run = hostile::RunIsolated([&] {
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
      if (XMPFiles::CheckFileFormat(path) != c.format) return 6;
      return 0;
    });
    ExpectBoundedSuccess(run, c.name);
    EXPECT_EQ(ovratest::ReadFile(path), bytes) << c.name;
  }
}

TEST(XMPHostileInput, StoredPacketsTheToolkitCannotParseMeanNoXMP) {
  // Well-formed XML that is not valid XMP: the handler would hand over an
  // empty or partial packet, and a write would replace what it dropped.
  ovratest::TempDir dir;
  const std::string packets[] = {
      hostile::Packet("<rdf:li>misplaced</rdf:li>"),
      hostile::Packet("<dc:format>kept</dc:format><dc:title><rdf:Bag><rdf:Alt/></rdf:Bag></dc:title>"),
  };
  int n = 0;
  for (const std::string& packet : packets) {
    const std::string path = (dir / ("bad" + std::to_string(++n) + ".jpg")).string();
    ovratest::WriteFile(path, JpegWith(hostile::Wrapped(packet)));
    testing::internal::CaptureStderr();  // the toolkit names what it dropped
    EXPECT_EQ(StoredFormat(path).rfind("<no XMP>", 0), 0u) << packet;
    testing::internal::GetCapturedStderr();
  }
}

TEST(XMPHostileInput, WellFormedFilesOfTheSameShapesAreRead) {
  ovratest::TempDir dir;
  const std::string packet = hostile::Packet("<dc:format>image/x-test</dc:format>");
  const struct {
    const char* file;
    std::string bytes;
  } cases[] = {
      {"ok.jpg", JpegWith(hostile::Wrapped(packet))},
      {"ext.jpg", hostile::JpegWithExtendedXMP(Jpeg(), packet)},
      {"ok.mp4", Mp4() + hostile::XMPBox(hostile::Wrapped(packet))},
      {"udta.mp4", hostile::Mp4WithNestedUdta(Mp4(), 3) + hostile::XMPBox(hostile::Wrapped(packet))},
      {"ok.wav", hostile::WavWithChunk(Wav(), hostile::RiffChunk("_PMX", hostile::Wrapped(packet)))},
  };
  for (const auto& c : cases) {
    const std::string path = (dir / c.file).string();
    ovratest::WriteFile(path, c.bytes);
    EXPECT_EQ(StoredFormat(path), "image/x-test") << c.file;
  }
}

TEST(XMPHostileInput, RelativePathsWithAFolderPartReachTheHandlers) {
  ovratest::TempDir dir;
  std::filesystem::create_directories(dir / "c");
  ovratest::WriteFile(dir / "c" / "x.jpg", JpegWith(hostile::Wrapped(hostile::Packet("<dc:format>rel</dc:format>"))));
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(dir.path());
  testing::internal::CaptureStderr();
  XMP_FileFormat format = XMPFiles::CheckFileFormat("c/x.jpg");
  const std::string value = StoredFormat("./c/../c/x.jpg");
  PutFormat("c/x.jpg", "rel2");
  const std::string errors = testing::internal::GetCapturedStderr();
  std::filesystem::current_path(before);
  EXPECT_EQ(format, kXMP_JPEGFile);
  EXPECT_EQ(value, "rel");
  EXPECT_EQ(errors, "");
  EXPECT_EQ(StoredFormat((dir / "c" / "x.jpg").string()), "rel2");
}

TEST(XMPHostileInput, WritesReplaceTheFileAndNeverWriteIntoTheOriginal) {
  // Some handlers rewrite a file in place (MP4, MP3), others through a file
  // of their own (JPEG). Either way the path ends up at a new inode with the
  // file's own permissions, the old inode (still reachable through a second
  // name) is byte for byte what it was, and nothing else is left over. The
  // second write is shorter than the first, which the PNG handler would
  // store in place over a longer packet, leaving stale bytes behind it.
  const std::pair<const char*, std::string> files[] = {
      {"safe.jpg", xmptest::media::Jpeg()}, {"safe.mp4", xmptest::media::Mp4()},
      {"safe.wav", xmptest::media::Wav()},  {"safe.png", xmptest::media::Png()},
      {"safe.tif", xmptest::media::Tiff()}, {"safe.mp3", xmptest::media::Mp3()}};
  for (const auto& [name, bytes] : files) {
    SCOPED_TRACE(name);
    ovratest::TempDir dir;
    const std::string path = (dir / name).string();
    const std::string kept = (dir / "kept").string();
    ovratest::WriteFile(path, bytes);
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    ASSERT_EQ(link(path.c_str(), kept.c_str()), 0);
    struct stat before {};
    ASSERT_EQ(stat(path.c_str(), &before), 0);
    PutFormat(path, "video/x-test");
    PutFormat(path, "video/mp4");
    struct stat after {};
    ASSERT_EQ(stat(path.c_str(), &after), 0);
    EXPECT_NE(before.st_ino, after.st_ino);
    EXPECT_EQ(after.st_mode & 07777, 0640u);
    EXPECT_EQ(ovratest::ReadFile(kept), bytes);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir.path()), std::filesystem::directory_iterator()), 2);
    EXPECT_EQ(StoredFormat(path), "video/mp4");
  }
}

TEST(XMPHostileInput, PNGWritesReplaceOnlyThePacketChunkTheToolkitReads) {
  // Every chunk around the packet stays, a compressed XMP chunk (which the
  // toolkit does not read) included, and every chunk's checksum holds.
  using xmptest::media::PngChunk;
  const std::string png = xmptest::media::Png();
  const std::string header = png.substr(0, 8 + 25), rest = png.substr(8 + 25);
  const std::string comment = PngChunk("tEXt", std::string("Comment\0keep me", 15));
  const std::string keyword = PngXMPKeyword();
  const std::string compressed = PngChunk("iTXt", keyword + std::string("\0\1\0\0\0x\x9c", 7));
  ovratest::TempDir dir;
  const std::string path = (dir / "chunks.png").string();
  ovratest::WriteFile(path, header + comment + compressed + rest);
  PutFormat(path, "image/png; a longer value that the second write shortens");
  PutFormat(path, "image/png");
  EXPECT_EQ(StoredFormat(path), "image/png");

  const std::string bytes = ovratest::ReadFile(path);
  ASSERT_EQ(bytes.compare(0, header.size(), header), 0);
  EXPECT_NE(bytes.find(comment), std::string::npos);
  EXPECT_NE(bytes.find(compressed), std::string::npos);
  int packets = 0;
  for (std::size_t pos = 8; pos + 12 <= bytes.size();) {
    const auto byte = [&](std::size_t i) { return std::uint32_t(static_cast<unsigned char>(bytes[i])); };
    const std::uint32_t length = byte(pos) << 24 | byte(pos + 1) << 16 | byte(pos + 2) << 8 | byte(pos + 3);
    ASSERT_LE(pos + 12 + length, bytes.size());
    const std::string body = bytes.substr(pos + 4, 4 + length);
    const std::uint32_t stored = byte(pos + 8 + length) << 24 | byte(pos + 9 + length) << 16 |
                                 byte(pos + 10 + length) << 8 | byte(pos + 11 + length);
    EXPECT_EQ(stored, xmptest::media::Crc32(body)) << body.substr(0, 4);
    if (body.compare(0, 6 + keyword.size(), "iTXt" + keyword + std::string(2, '\0')) == 0) ++packets;
    pos += 12 + length;
  }
  EXPECT_EQ(packets, 1);
}

TEST(XMPHostileInput, WritesThroughASymbolicLinkReplaceTheFileItNames) {
  ovratest::TempDir dir;
  std::filesystem::create_directories(dir / "real");
  const std::string real = (dir / "real" / "x.jpg").string();
  ovratest::WriteFile(real, Jpeg());
  std::filesystem::create_symlink("real/x.jpg", dir / "link.jpg");
  PutFormat((dir / "link.jpg").string(), "image/jpeg");
  EXPECT_TRUE(std::filesystem::is_symlink(dir / "link.jpg"));
  EXPECT_EQ(StoredFormat(real), "image/jpeg");
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir / "real"), std::filesystem::directory_iterator()), 1);
}

}  // namespace
