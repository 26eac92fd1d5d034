// Minimal, valid media files built byte by byte, and an independent reader
// (ExifTool) to check what the library wrote. Header-only so that other
// test programs can include it.
#pragma once

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace ovratest {
namespace media {

inline void AppendBE32(std::string& out, std::uint32_t v) {
  out += static_cast<char>((v >> 24) & 0xFF);
  out += static_cast<char>((v >> 16) & 0xFF);
  out += static_cast<char>((v >> 8) & 0xFF);
  out += static_cast<char>(v & 0xFF);
}
inline void AppendLE32(std::string& out, std::uint32_t v) {
  out += static_cast<char>(v & 0xFF);
  out += static_cast<char>((v >> 8) & 0xFF);
  out += static_cast<char>((v >> 16) & 0xFF);
  out += static_cast<char>((v >> 24) & 0xFF);
}
inline void AppendLE16(std::string& out, std::uint16_t v) {
  out += static_cast<char>(v & 0xFF);
  out += static_cast<char>((v >> 8) & 0xFF);
}
inline std::string Bytes(std::initializer_list<int> bytes) {
  std::string out;
  for (int b : bytes) out += static_cast<char>(b);
  return out;
}

// A 1x1 grey baseline JPEG: one 8x8 block whose DC difference and AC
// coefficients are all zero, coded with one-symbol Huffman tables.
inline std::string MinimalJPEG() {
  std::string out = Bytes({0xFF, 0xD8});
  out += Bytes({0xFF, 0xE0, 0x00, 0x10, 'J', 'F', 'I', 'F', 0x00, 0x01, 0x01, 0x00, 0x00, 0x01,
                0x00, 0x01, 0x00, 0x00});
  out += Bytes({0xFF, 0xDB, 0x00, 0x43, 0x00});
  out += std::string(64, '\x01');
  out += Bytes({0xFF, 0xC0, 0x00, 0x0B, 0x08, 0x00, 0x01, 0x00, 0x01, 0x01, 0x01, 0x11, 0x00});
  for (int tableClass : {0x00, 0x10}) {
    out += Bytes({0xFF, 0xC4, 0x00, 0x14, tableClass, 0x01});
    out += std::string(15, '\0');
    out += Bytes({0x00});
  }
  out += Bytes({0xFF, 0xDA, 0x00, 0x08, 0x01, 0x01, 0x00, 0x00, 0x3F, 0x00});
  out += Bytes({0x3F});  // DC category 0, then end of block; padded with ones
  out += Bytes({0xFF, 0xD9});
  return out;
}

// A RIFF/WAVE file: PCM, mono, 8 kHz, 8 bits, eight samples of silence.
inline std::string MinimalWAV() {
  std::string fmt;
  AppendLE16(fmt, 1);     // PCM
  AppendLE16(fmt, 1);     // channels
  AppendLE32(fmt, 8000);  // sample rate
  AppendLE32(fmt, 8000);  // byte rate
  AppendLE16(fmt, 1);     // block align
  AppendLE16(fmt, 8);     // bits per sample
  const std::string samples(8, '\x80');
  std::string body = "WAVE";
  body += "fmt ";
  AppendLE32(body, static_cast<std::uint32_t>(fmt.size()));
  body += fmt;
  body += "data";
  AppendLE32(body, static_cast<std::uint32_t>(samples.size()));
  body += samples;
  std::string out = "RIFF";
  AppendLE32(out, static_cast<std::uint32_t>(body.size()));
  return out + body;
}

// An MPEG-4 file: file type, a movie header without tracks, empty media data.
inline std::string MinimalMP4() {
  std::string ftyp;
  AppendBE32(ftyp, 24);
  ftyp += "ftypmp42";
  AppendBE32(ftyp, 0);
  ftyp += "mp42isom";

  std::string mvhd;
  AppendBE32(mvhd, 108);
  mvhd += "mvhd";
  AppendBE32(mvhd, 0);           // version and flags
  AppendBE32(mvhd, 0);           // creation time
  AppendBE32(mvhd, 0);           // modification time
  AppendBE32(mvhd, 1000);        // time scale
  AppendBE32(mvhd, 0);           // duration
  AppendBE32(mvhd, 0x00010000);  // rate 1.0
  mvhd += Bytes({0x01, 0x00});   // volume 1.0
  mvhd += std::string(10, '\0');
  for (std::uint32_t m : {0x00010000u, 0u, 0u, 0u, 0x00010000u, 0u, 0u, 0u, 0x40000000u}) {
    AppendBE32(mvhd, m);
  }
  mvhd += std::string(24, '\0');
  AppendBE32(mvhd, 1);  // next track id

  std::string moov;
  AppendBE32(moov, static_cast<std::uint32_t>(8 + mvhd.size()));
  moov += "moov";
  moov += mvhd;

  std::string mdat;
  AppendBE32(mdat, 8);
  mdat += "mdat";
  return ftyp + moov + mdat;
}

// ---- ExifTool as an independent reader ----

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
}  // namespace ovratest
