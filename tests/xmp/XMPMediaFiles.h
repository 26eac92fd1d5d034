// Byte builders for the smallest media files that the file handlers accept
// (one pixel, one sample, one frame; no XMP inside), and ExifTool as an
// independent reader and writer.
#pragma once

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace xmptest {
namespace media {

inline void Put16BE(std::string& s, std::uint32_t v) {
  s += static_cast<char>(v >> 8);
  s += static_cast<char>(v);
}
inline void Put32BE(std::string& s, std::uint32_t v) {
  Put16BE(s, v >> 16);
  Put16BE(s, v & 0xFFFF);
}
inline void Put16LE(std::string& s, std::uint32_t v) {
  s += static_cast<char>(v);
  s += static_cast<char>(v >> 8);
}
inline void Put32LE(std::string& s, std::uint32_t v) {
  Put16LE(s, v & 0xFFFF);
  Put16LE(s, v >> 16);
}

inline std::uint32_t Crc32(const std::string& data) {
  std::uint32_t crc = 0xFFFFFFFFu;
  for (unsigned char byte : data) {
    crc ^= byte;
    for (int k = 0; k < 8; ++k) crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1u)));
  }
  return ~crc;
}

inline std::string Jpeg() {
  std::string s("\xFF\xD8", 2);
  s += std::string("\xFF\xE0\x00\x10JFIF\x00\x01\x01\x00\x00\x01\x00\x01\x00\x00", 18);
  s += std::string("\xFF\xDB\x00\x43\x00", 5) + std::string(64, '\x01');
  s += std::string("\xFF\xC0\x00\x0B\x08\x00\x01\x00\x01\x01\x01\x11\x00", 13);
  s += std::string("\xFF\xC4\x00\x14\x00\x01", 6) + std::string(15, '\0') + std::string("\x00", 1);
  s += std::string("\xFF\xDA\x00\x08\x01\x01\x00\x00\x3F\x00", 10);
  s += std::string("\x00\x00", 2);
  s += std::string("\xFF\xD9", 2);
  return s;
}

inline std::string PngChunk(const std::string& type, const std::string& data) {
  std::string s;
  Put32BE(s, static_cast<std::uint32_t>(data.size()));
  Put32BE(s, 0);  // placeholder replaced below
  s.resize(4);
  s += type + data;
  Put32BE(s, Crc32(type + data));
  return s;
}

inline std::string Png() {
  std::string s("\x89PNG\r\n\x1A\n", 8);
  std::string ihdr;
  Put32BE(ihdr, 1);
  Put32BE(ihdr, 1);
  ihdr += std::string("\x08\x00\x00\x00\x00", 5);
  s += PngChunk("IHDR", ihdr);
  s += PngChunk("IDAT", std::string("\x78\x9C\x63\x60\x00\x00\x00\x02\x00\x01", 10));
  s += PngChunk("IEND", std::string());
  return s;
}

inline std::string Tiff() {
  std::string s("II*\0", 4);
  Put32LE(s, 8);
  const struct {
    std::uint16_t tag, type;
    std::uint32_t value;
  } entries[] = {{256, 3, 1}, {257, 3, 1}, {258, 3, 8}, {259, 3, 1}, {262, 3, 1},
                 {273, 4, 0 /* strip offset, set below */}, {277, 3, 1}, {278, 3, 1}, {279, 4, 1}};
  const std::uint32_t count = sizeof entries / sizeof entries[0];
  const std::uint32_t dataOffset = 8 + 2 + count * 12 + 4;
  Put16LE(s, count);
  for (const auto& e : entries) {
    Put16LE(s, e.tag);
    Put16LE(s, e.type);
    Put32LE(s, 1);
    if (e.type == 3) {
      Put16LE(s, e.value);
      Put16LE(s, 0);
    } else {
      Put32LE(s, e.tag == 273 ? dataOffset : e.value);
    }
  }
  Put32LE(s, 0);
  s += '\x80';
  return s;
}

inline std::string Box(const std::string& type, const std::string& payload) {
  std::string s;
  Put32BE(s, static_cast<std::uint32_t>(8 + payload.size()));
  return s + type + payload;
}

inline std::string Mp4() {
  std::string ftyp = "isom";
  Put32BE(ftyp, 0x200);
  ftyp += "isommp41";
  std::string mvhd(4, '\0');  // version and flags
  Put32BE(mvhd, 0);           // creation
  Put32BE(mvhd, 0);           // modification
  Put32BE(mvhd, 1000);        // timescale
  Put32BE(mvhd, 1000);        // duration
  Put32BE(mvhd, 0x00010000);  // rate
  Put16BE(mvhd, 0x0100);      // volume
  mvhd += std::string(10, '\0');
  const std::uint32_t matrix[9] = {0x10000, 0, 0, 0, 0x10000, 0, 0, 0, 0x40000000};
  for (std::uint32_t m : matrix) Put32BE(mvhd, m);
  mvhd += std::string(24, '\0');
  Put32BE(mvhd, 2);  // next track id
  return Box("ftyp", ftyp) + Box("moov", Box("mvhd", mvhd)) + Box("mdat", std::string(8, '\0'));
}

inline std::string Wav() {
  std::string fmt;
  Put16LE(fmt, 1);
  Put16LE(fmt, 1);
  Put32LE(fmt, 8000);
  Put32LE(fmt, 8000);
  Put16LE(fmt, 1);
  Put16LE(fmt, 8);
  std::string body = "WAVE";
  body += "fmt ";
  Put32LE(body, static_cast<std::uint32_t>(fmt.size()));
  body += fmt;
  body += "data";
  Put32LE(body, 4);
  body += std::string(4, '\x80');
  std::string s = "RIFF";
  Put32LE(s, static_cast<std::uint32_t>(body.size()));
  return s + body;
}

inline std::string Mp3() {
  // MPEG-1 layer III, 128 kbit/s, 44.1 kHz: 417-byte frames.
  std::string frame("\xFF\xFB\x90\x64", 4);
  frame += std::string(413, '\0');
  return frame + frame + frame;
}

// The test main sets a locale that may not be installed; perl would warn.
inline bool HaveExifTool() {
  static const bool have = std::system("LC_ALL=C exiftool -ver >/dev/null 2>&1") == 0;
  return have;
}

// Runs a shell command and returns its standard output.
inline std::string RunCommand(const std::string& command) {
  std::string output;
  if (FILE* pipe = ::popen(command.c_str(), "r")) {
    char buffer[4096];
    std::size_t n;
    while ((n = std::fread(buffer, 1, sizeof buffer, pipe)) > 0) output.append(buffer, n);
    ::pclose(pipe);
  }
  return output;
}

// The value of one tag as ExifTool prints it (e.g. "XMP-xmp:Label"),
// without the final newline; empty when the tag is absent.
inline std::string ExifToolValue(const std::filesystem::path& file, const std::string& tag) {
  std::string out = RunCommand("LC_ALL=C exiftool -s3 -" + tag + " '" + file.string() + "' 2>/dev/null");
  while (!out.empty() && (out.back() == '\n' || out.back() == '\r')) out.pop_back();
  return out;
}

}  // namespace media
}  // namespace xmptest
