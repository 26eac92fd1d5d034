// Writes the seed corpora of the fuzz targets into the folder given:
// definitions/, xmp_buffer/ and media_file/ (one file per seed).
#include <filesystem>
#include <fstream>
#include <iostream>
#include <sstream>
#include <string>

#include "HostileInputs.h"
#include "XMPMediaFiles.h"

namespace fs = std::filesystem;

namespace {

void Write(const fs::path& folder, const std::string& name, const std::string& bytes) {
  fs::create_directories(folder);
  std::ofstream(folder / name, std::ios::binary) << bytes;
}

std::string Read(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream content;
  content << in.rdbuf();
  return content.str();
}

// The media target takes the first byte as the extension's index.
std::string Media(int extension, const std::string& bytes) { return std::string(1, static_cast<char>(extension)) + bytes; }

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::cerr << "usage: fuzz_make_corpus <folder>\n";
    return 2;
  }
  const fs::path root = argv[1];

  for (const auto& entry : fs::directory_iterator(OVRA_RESOURCES_DIR))
    if (entry.path().extension() == ".xml") Write(root / "definitions", entry.path().filename().string(), Read(entry.path()));
  Write(root / "definitions", "small.xml",
        "<xmp_definitions xmlns:ui=\"http://ns.orlex.com/xmp/ui/\"><xmp_schema namespace=\"http://x/\" prefix=\"x\" "
        "label=\"X\"><xmp_property name=\"a\" type=\"text\" label=\"A\"/><xmp_property name=\"b\" type=\"bag\" "
        "element_type=\"integer\"/></xmp_schema><xmp_type id=\"T\"><xmp_field name=\"f\" type=\"real\"/></xmp_type>"
        "</xmp_definitions>");

  const std::string packet = hostile::Packet(
      "<dc:format>image/jpeg</dc:format><dc:title><rdf:Alt><rdf:li xml:lang=\"x-default\">Title</rdf:li></rdf:Alt>"
      "</dc:title><dc:subject><rdf:Bag><rdf:li>a</rdf:li><rdf:li>b</rdf:li></rdf:Bag></dc:subject>"
      "<xmp:Rating>3</xmp:Rating><xmp:s rdf:parseType=\"Resource\"><xmp:f>1</xmp:f></xmp:s>");
  const fs::path buffers = root / "xmp_buffer";
  Write(buffers, "realworld.xmp", Read(fs::path(OVRA_TEST_DATA_DIR) / "xmp" / "realworld.xmp"));
  Write(buffers, "packet.xmp", packet);
  Write(buffers, "wrapped.xmp", hostile::Wrapped(packet));
  Write(buffers, "nested.xmp", hostile::DeepResources(20));
  Write(buffers, "bag.xmp", hostile::BigBag(40));
  Write(buffers, "descriptions.xmp", hostile::ManyDescriptions(5));

  const fs::path media = root / "media_file";
  const std::string wrapped = hostile::Wrapped(packet);
  Write(media, "xmp.jpg", Media(0, hostile::JpegWithSegments(xmptest::media::Jpeg(), {hostile::StandardXMPSegment(wrapped)})));
  Write(media, "extended.jpg", Media(0, hostile::JpegWithExtendedXMP(xmptest::media::Jpeg(), packet)));
  Write(media, "bare.jpg", Media(0, xmptest::media::Jpeg()));
  Write(media, "xmp.mp4", Media(1, xmptest::media::Mp4() + hostile::XMPBox(wrapped)));
  Write(media, "udta.mov", Media(2, hostile::Mp4WithNestedUdta(xmptest::media::Mp4(), 3)));
  Write(media, "xmp.wav", Media(3, hostile::WavWithChunk(xmptest::media::Wav(), hostile::RiffChunk("_PMX", wrapped))));
  Write(media, "bare.png", Media(5, xmptest::media::Png()));
  Write(media, "bare.tif", Media(6, xmptest::media::Tiff()));
  Write(media, "bare.mp3", Media(7, xmptest::media::Mp3()));
  Write(media, "sidecar.xmp", Media(10, packet));
  Write(media, "packet.bin", Media(11, "junk" + wrapped + "junk"));
  for (const auto& entry : fs::directory_iterator(fs::path(OVRA_TEST_DATA_DIR) / "hostile")) {
    const std::string ext = entry.path().extension().string();
    const int index = ext == ".jpg" ? 0 : ext == ".mp4" ? 1 : ext == ".wav" ? 3 : 11;
    Write(media, "hostile-" + entry.path().filename().string(), Media(index, Read(entry.path())));
  }
  return 0;
}
