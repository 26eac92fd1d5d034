// Generators of hostile XMP and media files, and a way to run a piece of
// code in a child process so that a crash, a hang or a memory blow-up fails
// one test instead of killing the test program. Header-only so that other
// test programs can include it.
#pragma once

#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "XMPMediaFiles.h"

namespace hostile {

inline const char kHead[] =
    "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF "
    "xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
    "<rdf:Description rdf:about=\"\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\" "
    "xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\">";
inline const char kTail[] = "</rdf:Description></rdf:RDF></x:xmpmeta>";

inline std::string Packet(const std::string& properties) { return kHead + properties + kTail; }

inline std::string Repeat(const std::string& part, std::size_t times) {
  std::string out;
  out.reserve(part.size() * times);
  for (std::size_t i = 0; i < times; ++i) out += part;
  return out;
}

// Structures nested `levels` deep: <xmp:a rdf:parseType="Resource"> ...
inline std::string DeepResources(std::size_t levels) {
  return Packet(Repeat("<xmp:a rdf:parseType=\"Resource\">", levels) + Repeat("</xmp:a>", levels));
}

// Plain elements nested `levels` deep inside one property.
inline std::string DeepElements(std::size_t levels) {
  return Packet("<xmp:a>" + Repeat("<e>", levels) + Repeat("</e>", levels) + "</xmp:a>");
}

// `count` distinct simple properties on the one schema node.
inline std::string ManyProperties(std::size_t count) {
  std::string properties;
  properties.reserve(count * 24);
  for (std::size_t i = 0; i < count; ++i) properties += "<xmp:p" + std::to_string(i) + ">v</xmp:p" + std::to_string(i) + ">";
  return Packet(properties);
}

// The same properties, each in its own rdf:Description (the toolkit merges
// them into one node).
inline std::string ManyDescriptions(std::size_t count) {
  std::string body =
      "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">";
  for (std::size_t i = 0; i < count; ++i)
    body += "<rdf:Description rdf:about=\"\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\"><xmp:p" + std::to_string(i) +
            ">v</xmp:p" + std::to_string(i) + "></rdf:Description>";
  return body + "</rdf:RDF></x:xmpmeta>";
}

// A bag of `count` items.
inline std::string BigBag(std::size_t count) {
  return Packet("<dc:subject><rdf:Bag>" + Repeat("<rdf:li>k</rdf:li>", count) + "</rdf:Bag></dc:subject>");
}

inline std::string BillionLaughs() {
  std::string dtd = "<?xml version=\"1.0\"?><!DOCTYPE x:xmpmeta [<!ENTITY l0 \"ha\">";
  for (int i = 1; i < 10; ++i) {
    dtd += "<!ENTITY l" + std::to_string(i) + " \"";
    for (int k = 0; k < 10; ++k) dtd += "&l" + std::to_string(i - 1) + ";";
    dtd += "\">";
  }
  dtd += "]>";
  return dtd + Packet("<dc:format>&l9;</dc:format>");
}

// A value with bytes that are not UTF-8 (Latin-1 "é" and a lone
// continuation byte).
inline std::string InvalidUTF8() { return Packet("<dc:format>caf\xE9 \x80</dc:format>"); }

inline std::string Wrapped(const std::string& packet) {
  return "<?xpacket begin=\"\xEF\xBB\xBF\" id=\"W5M0MpCehiHzreSzNTczkc9d\"?>" + packet +
         "<?xpacket end=\"w\"?>";
}

// ---- Media files ----

using xmptest::media::Box;
using xmptest::media::Put16BE;
using xmptest::media::Put32BE;
using xmptest::media::Put32LE;

// Inserts APP1 segments right after the SOI marker of a JPEG.
inline std::string JpegWithSegments(const std::string& jpeg, const std::vector<std::string>& app1Contents) {
  std::string segments;
  for (const std::string& content : app1Contents) {
    segments += "\xFF\xE1";
    Put16BE(segments, static_cast<std::uint32_t>(content.size() + 2));
    segments += content;
  }
  return jpeg.substr(0, 2) + segments + jpeg.substr(2);
}

inline std::string StandardXMPSegment(const std::string& packet) {
  return std::string("http://ns.adobe.com/xap/1.0/", 29) + packet;
}

inline std::string JpegWithPacket(const std::string& jpeg, const std::string& packet) {
  return JpegWithSegments(jpeg, {StandardXMPSegment(packet)});
}

// A JPEG whose standard XMP points at Extended XMP that carries `extended`,
// split into segments as writers do.
inline std::string JpegWithExtendedXMP(const std::string& jpeg, const std::string& extended) {
  const std::string guid = "0123456789ABCDEF0123456789ABCDEF";
  std::vector<std::string> contents;
  contents.push_back(StandardXMPSegment(Wrapped(
      "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
      "<rdf:Description rdf:about=\"\" xmlns:xmpNote=\"http://ns.adobe.com/xmp/note/\" "
      "xmpNote:HasExtendedXMP=\"" + guid + "\"/></rdf:RDF></x:xmpmeta>")));
  const std::size_t chunk = 65000;
  for (std::size_t offset = 0; offset < extended.size(); offset += chunk) {
    std::string content("http://ns.adobe.com/xmp/extension/", 35);
    content += guid;
    Put32BE(content, static_cast<std::uint32_t>(extended.size()));
    Put32BE(content, static_cast<std::uint32_t>(offset));
    content += extended.substr(offset, chunk);
    contents.push_back(content);
  }
  return JpegWithSegments(jpeg, contents);
}

inline std::string XMPBox(const std::string& packet) {
  static const char kUuid[] = "\xBE\x7A\xCF\xCB\x97\xA9\x42\xE8\x9C\x71\x99\x94\x91\xE3\xAF\xAC";
  return Box("uuid", std::string(kUuid, 16) + packet);
}

// An MP4 (as built by the caller) with `levels` udta boxes nested in moov.
inline std::string Mp4WithNestedUdta(const std::string& mp4, std::size_t levels) {
  std::string nested;
  for (std::size_t i = 0; i < levels; ++i) nested = Box("udta", nested);
  return mp4 + Box("moov", nested);
}

// The first box named `type` gets a size far past the end of the file.
inline std::string WithBrokenBoxSize(std::string mp4, const std::string& type) {
  const std::size_t at = mp4.find(type);
  if (at == std::string::npos || at < 4) return mp4;
  mp4[at - 4] = '\x7F';
  return mp4;
}

inline std::string RiffChunk(const std::string& id, const std::string& payload) {
  std::string s = id;
  Put32LE(s, static_cast<std::uint32_t>(payload.size()));
  s += payload;
  if (payload.size() & 1) s += '\0';
  return s;
}

// A WAV (as built by the caller) with an XMP chunk appended inside RIFF.
inline std::string WavWithChunk(const std::string& wav, const std::string& chunk) {
  std::string body = wav.substr(8) + chunk;
  std::string s = "RIFF";
  Put32LE(s, static_cast<std::uint32_t>(body.size()));
  return s + body;
}

// ---- Isolation ----

struct ChildResult {
  bool exited = false;  // false: killed by a signal (crash) or by the time limit
  int code = -1;        // exit code when exited
  double seconds = 0;
  long peakKB = 0;      // the child's peak resident size
};

// Runs body in a child process (its return value is the exit code) with a
// time limit; the child's peak memory comes from wait4.
inline ChildResult RunIsolated(const std::function<int()>& body, int limitSeconds = 60) {
  ChildResult result;
  const auto start = std::chrono::steady_clock::now();
  const pid_t pid = fork();
  if (pid == 0) {
    alarm(static_cast<unsigned>(limitSeconds));
    int code = 99;
    try {
      code = body();
    } catch (...) {
      code = 98;
    }
    _exit(code);
  }
  if (pid < 0) return result;
  int status = 0;
  struct rusage usage {};
  wait4(pid, &status, 0, &usage);
  result.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  result.exited = WIFEXITED(status);
  result.code = result.exited ? WEXITSTATUS(status) : -WTERMSIG(status);
  result.peakKB = usage.ru_maxrss;
  return result;
}

// The resident size of this process now, in KB.
inline long CurrentRssKB() {
  std::ifstream status("/proc/self/status");
  std::string key;
  while (status >> key) {
    if (key == "VmRSS:") {
      long kb = 0;
      status >> kb;
      return kb;
    }
    std::getline(status, key);
  }
  return 0;
}

}  // namespace hostile
