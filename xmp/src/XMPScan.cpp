// The bounded pre-scans of packets and media files (see XMPScan.h).
#include "XMPScan.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <map>
#include <optional>
#include <string_view>
#include <vector>

#include <expat.h>

#include <ovraxmp/XMPError.h>

#include "XMPPacket.h"

namespace ovraxmp {
namespace detail {

// ---------------------------------------------------------------------------
// PacketScanner

namespace {

constexpr char kSep = '\x01';  // between namespace URI and local name
const std::string kRDF = std::string("http://www.w3.org/1999/02/22-rdf-syntax-ns#") + kSep + "RDF";
const std::string kDescription =
    std::string("http://www.w3.org/1999/02/22-rdf-syntax-ns#") + kSep + "Description";

enum class NodeKind : unsigned char { kOther, kRDF, kTopDescription };

}  // namespace

struct PacketScanner::State {
  PacketScanner* owner = nullptr;
  XML_Parser parser = nullptr;
  std::vector<std::uint32_t> counts;  // properties of each open element
  std::vector<NodeKind> kinds;
  std::uint32_t topLevelProperties = 0;  // of every rdf:Description under rdf:RDF
  std::uint64_t fed = 0;

  void Stop(const std::string& why) noexcept {
    if (owner->mProblem.empty()) owner->mProblem = why;
    XML_StopParser(parser, XML_FALSE);
  }

  bool Add(std::uint32_t* count, std::uint32_t more) noexcept {
    *count += std::min<std::uint32_t>(more, kMaxPropertiesPerNode + 1);
    if (*count <= kMaxPropertiesPerNode) return true;
    Stop("more than " + std::to_string(kMaxPropertiesPerNode) + " properties on one node");
    return false;
  }

  static void XMLCALL Start(void* data, const XML_Char* name, const XML_Char** atts) noexcept {
    State& self = *static_cast<State*>(data);
    if (self.counts.size() + 1 > static_cast<std::size_t>(kMaxNestingDepth)) {
      self.Stop("elements nested deeper than " + std::to_string(kMaxNestingDepth) + " levels");
      return;
    }
    const NodeKind parent = self.kinds.empty() ? NodeKind::kOther : self.kinds.back();
    if (!self.counts.empty()) {
      std::uint32_t* count = parent == NodeKind::kTopDescription ? &self.topLevelProperties : &self.counts.back();
      if (!self.Add(count, 1)) return;
    }
    std::uint32_t attributes = 0;
    for (const XML_Char** a = atts; *a; a += 2) ++attributes;
    NodeKind kind = NodeKind::kOther;
    if (kRDF == name) {
      kind = NodeKind::kRDF;
      self.topLevelProperties = 0;
    } else if (parent == NodeKind::kRDF && kDescription == name) {
      kind = NodeKind::kTopDescription;
    }
    std::uint32_t own = 0;
    if (!self.Add(kind == NodeKind::kTopDescription ? &self.topLevelProperties : &own, attributes)) return;
    self.counts.push_back(own);
    self.kinds.push_back(kind);
  }

  static void XMLCALL End(void* data, const XML_Char*) noexcept {
    State& self = *static_cast<State*>(data);
    if (self.counts.empty()) return;
    self.counts.pop_back();
    self.kinds.pop_back();
    if (self.counts.empty() && self.owner->mStopAtRootEnd) {
      self.owner->mComplete = true;
      XML_StopParser(self.parser, XML_FALSE);
    }
  }

  static void XMLCALL Doctype(void* data, const XML_Char*, const XML_Char*, const XML_Char*, int) noexcept {
    static_cast<State*>(data)->Stop("a DOCTYPE is not allowed");
  }
};

PacketScanner::PacketScanner() : mState(new State) {
  mState->owner = this;
  mState->parser = XML_ParserCreateNS(nullptr, kSep);
  if (!mState->parser) Throw(kXMPErr_NoMemory, "scanning XMP");
  XML_SetUserData(mState->parser, mState.get());
  XML_SetElementHandler(mState->parser, &State::Start, &State::End);
  XML_SetStartDoctypeDeclHandler(mState->parser, &State::Doctype);
}

PacketScanner::~PacketScanner() { XML_ParserFree(mState->parser); }

bool PacketScanner::Feed(const char* data, std::size_t length, bool last) {
  if (Refused()) return false;
  if (mComplete) return true;
  mState->fed += length;
  if (mState->fed > kMaxPacketBytes) {
    mProblem = "packet larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB";
    return false;
  }
  const std::size_t kPiece = 1u << 30;  // expat takes int lengths
  std::size_t done = 0;
  do {
    const std::size_t part = std::min(kPiece, length - done);
    const bool final = last && done + part == length;
    if (XML_Parse(mState->parser, data + done, static_cast<int>(part), final) != XML_STATUS_OK) {
      if (mComplete) return true;
      if (mProblem.empty()) mProblem = XML_ErrorString(XML_GetErrorCode(mState->parser));
      return false;
    }
    if (mComplete) return true;
    done += part;
  } while (done < length);
  return true;
}

std::uint64_t PacketScanner::Consumed() const {
  const XML_Index index = XML_GetCurrentByteIndex(mState->parser);
  return index < 0 ? mState->fed : static_cast<std::uint64_t>(index);
}

// ---------------------------------------------------------------------------
// The quick pass over buffers

namespace {

// True when the bytes are UTF-8 (no overlong forms, no surrogates, nothing
// above U+10FFFF): the toolkit would take other bytes for Latin-1.
bool IsUTF8(const unsigned char* p, std::size_t n) {
  std::size_t i = 0;
  while (i < n) {
    while (i + 8 <= n) {
      std::uint64_t word;
      std::memcpy(&word, p + i, 8);
      if (word & 0x8080808080808080ull) break;
      i += 8;
    }
    if (i >= n) break;
    const unsigned char c = p[i];
    if (c < 0x80) {
      ++i;
      continue;
    }
    std::size_t more;
    unsigned char low = 0x80, high = 0xBF;  // bounds of the second byte
    if (c >= 0xC2 && c <= 0xDF) {
      more = 1;
    } else if (c >= 0xE0 && c <= 0xEF) {
      more = 2;
      if (c == 0xE0) low = 0xA0;
      if (c == 0xED) high = 0x9F;
    } else if (c >= 0xF0 && c <= 0xF4) {
      more = 3;
      if (c == 0xF0) low = 0x90;
      if (c == 0xF4) high = 0x8F;
    } else {
      return false;
    }
    if (i + more >= n) return false;
    if (p[i + 1] < low || p[i + 1] > high) return false;
    for (std::size_t k = 2; k <= more; ++k)
      if ((p[i + k] & 0xC0) != 0x80) return false;
    i += more + 1;
  }
  return true;
}

enum class Quick { kSane, kRefused, kAskExpat };

bool IsSpace(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }

// The local part of a prefixed name.
std::string_view LocalName(std::string_view name) {
  const std::size_t colon = name.find(':');
  return colon == std::string_view::npos ? name : name.substr(colon + 1);
}

// The bounds of PacketScanner, checked by a pass that only follows the
// markup of well-formed UTF-8 XML, several times faster than expat, so that
// real packets pay little for the check. Anything it does not follow
// (other encodings, DOCTYPE, unbalanced or broken markup) is left to the
// expat scan, which then gives the verdict.
Quick QuickScan(const char* text, std::size_t n, std::string* problem) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(text);
  if (n >= 2 && (bytes[0] == 0 || bytes[1] == 0 || bytes[0] == 0xFE || bytes[0] == 0xFF)) return Quick::kAskExpat;
  if (!IsUTF8(bytes, n)) return Quick::kAskExpat;
  std::vector<std::uint32_t> counts;
  std::vector<NodeKind> kinds;
  std::uint32_t topLevel = 0;
  bool sawElement = false;
  const auto add = [&](std::uint32_t* count, std::uint32_t more) {
    *count += std::min<std::uint32_t>(more, kMaxPropertiesPerNode + 1);
    if (*count <= kMaxPropertiesPerNode) return true;
    *problem = "more than " + std::to_string(kMaxPropertiesPerNode) + " properties on one node";
    return false;
  };
  const std::string_view all(text, n);
  std::size_t i = 0;
  while (i < n) {
    const void* lt = std::memchr(text + i, '<', n - i);
    if (!lt) break;
    std::size_t j = static_cast<std::size_t>(static_cast<const char*>(lt) - text) + 1;
    if (j >= n) return Quick::kAskExpat;
    const char c = text[j];
    if (c == '?') {
      const std::size_t end = all.find("?>", j);
      if (end == std::string_view::npos) return Quick::kAskExpat;
      i = end + 2;
    } else if (c == '!') {
      std::size_t end;
      if (all.compare(j, 3, "!--") == 0) {
        end = all.find("-->", j + 3);
      } else if (all.compare(j, 8, "![CDATA[") == 0) {
        end = all.find("]]>", j + 8);
      } else {
        return Quick::kAskExpat;
      }
      if (end == std::string_view::npos) return Quick::kAskExpat;
      i = end + 3;
    } else if (c == '/') {
      const void* gt = std::memchr(text + j, '>', n - j);
      if (!gt || counts.empty()) return Quick::kAskExpat;
      counts.pop_back();
      kinds.pop_back();
      i = static_cast<std::size_t>(static_cast<const char*>(gt) - text) + 1;
    } else {
      std::size_t k = j;
      while (k < n && !IsSpace(text[k]) && text[k] != '/' && text[k] != '>') ++k;
      if (k == j || k >= n) return Quick::kAskExpat;
      if (counts.size() + 1 > static_cast<std::size_t>(kMaxNestingDepth)) {
        *problem = "elements nested deeper than " + std::to_string(kMaxNestingDepth) + " levels";
        return Quick::kRefused;
      }
      const NodeKind parent = kinds.empty() ? NodeKind::kOther : kinds.back();
      if (!counts.empty() && !add(parent == NodeKind::kTopDescription ? &topLevel : &counts.back(), 1))
        return Quick::kRefused;
      const std::string_view local = LocalName(all.substr(j, k - j));
      NodeKind kind = NodeKind::kOther;
      if (local == "RDF") {
        kind = NodeKind::kRDF;
        topLevel = 0;
      } else if (parent == NodeKind::kRDF && local == "Description") {
        kind = NodeKind::kTopDescription;
      }
      sawElement = true;
      std::uint32_t attributes = 0;
      bool open = false;
      for (;;) {
        while (k < n && IsSpace(text[k])) ++k;
        if (k >= n) return Quick::kAskExpat;
        if (text[k] == '>') {
          open = true;
          ++k;
          break;
        }
        if (text[k] == '/') {
          if (k + 1 >= n || text[k + 1] != '>') return Quick::kAskExpat;
          k += 2;
          break;
        }
        const std::size_t nameStart = k;
        while (k < n && text[k] != '=' && !IsSpace(text[k]) && text[k] != '>' && text[k] != '/') ++k;
        const std::string_view attribute = all.substr(nameStart, k - nameStart);
        while (k < n && IsSpace(text[k])) ++k;
        if (k >= n || text[k] != '=' || attribute.empty()) return Quick::kAskExpat;
        ++k;
        while (k < n && IsSpace(text[k])) ++k;
        if (k >= n || (text[k] != '"' && text[k] != '\'')) return Quick::kAskExpat;
        const void* close = std::memchr(text + k + 1, text[k], n - k - 1);
        if (!close) return Quick::kAskExpat;
        k = static_cast<std::size_t>(static_cast<const char*>(close) - text) + 1;
        if (attribute.compare(0, 5, "xmlns") != 0) ++attributes;
      }
      std::uint32_t own = 0;
      if (!add(kind == NodeKind::kTopDescription ? &topLevel : &own, attributes)) return Quick::kRefused;
      if (open) {
        counts.push_back(own);
        kinds.push_back(kind);
      }
      i = k;
    }
  }
  return counts.empty() && sawElement ? Quick::kSane : Quick::kAskExpat;
}

}  // namespace

void RequireSanePacket(const char* buffer, std::size_t length) {
  while (length > 0 && buffer[length - 1] == '\0') --length;  // padding the toolkit tolerates
  if (length > kMaxPacketBytes)
    Throw(kXMPErr_BadXML, "parsing XMP: packet larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB");
  std::string problem;
  switch (QuickScan(buffer, length, &problem)) {
    case Quick::kSane:
      return;
    case Quick::kRefused:
      Throw(kXMPErr_BadXML, "parsing XMP: " + problem);
    case Quick::kAskExpat:
      break;
  }
  PacketScanner scan;
  if (!scan.Feed(buffer, length, true)) Throw(kXMPErr_BadXML, "parsing XMP: " + scan.Problem());
}

// ---------------------------------------------------------------------------
// Media files

namespace {

constexpr int kMaxContainerDepth = 32;            // real files nest fewer than 10 levels
constexpr std::uint64_t kMaxBoxes = 1000000;      // boxes or chunks visited per file
constexpr std::uint32_t kMaxPacketsPerFile = 1000;
constexpr std::size_t kReadPiece = 1u << 20;
constexpr std::uint64_t kWholeRead = 16u << 20;  // stored packets up to this size are read at once

std::uint32_t BE32(const unsigned char* p) {
  return (std::uint32_t(p[0]) << 24) | (std::uint32_t(p[1]) << 16) | (std::uint32_t(p[2]) << 8) | p[3];
}
std::uint32_t LE32(const unsigned char* p) {
  return (std::uint32_t(p[3]) << 24) | (std::uint32_t(p[2]) << 16) | (std::uint32_t(p[1]) << 8) | p[0];
}
std::uint64_t BE64(const unsigned char* p) { return (std::uint64_t(BE32(p)) << 32) | BE32(p + 4); }

// The file, read in pieces with pread: a hostile file may be huge, and one
// truncated while it is read must not bring the process down. The head is
// read at once: the walks ask for a few bytes at a time, and most media
// files keep their metadata near the start.
class Reader {
 public:
  explicit Reader(const std::string& path) {
    mFd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    struct stat info {};
    if (mFd >= 0 && ::fstat(mFd, &info) == 0) mSize = static_cast<std::uint64_t>(info.st_size);
    if (mFd >= 0 && mSize > 0) {
      mHead.resize(static_cast<std::size_t>(std::min<std::uint64_t>(mSize, kHeadSize)));
      std::size_t have = 0;
      while (have < mHead.size()) {
        const ssize_t got = ::pread(mFd, mHead.data() + have, mHead.size() - have, static_cast<off_t>(have));
        if (got <= 0) break;
        have += static_cast<std::size_t>(got);
      }
      mHead.resize(have);
    }
  }
  ~Reader() {
    if (mFd >= 0) ::close(mFd);
  }
  Reader(const Reader&) = delete;
  Reader& operator=(const Reader&) = delete;

  bool Ok() const { return mFd >= 0; }
  std::uint64_t Size() const { return mSize; }
  // Exactly length bytes at offset, or false.
  bool Read(std::uint64_t offset, void* out, std::size_t length) const {
    if (offset <= mHead.size() && length <= mHead.size() - offset) {
      if (length > 0) std::memcpy(out, mHead.data() + offset, length);
      return true;
    }
    auto* p = static_cast<char*>(out);
    while (length > 0) {
      const ssize_t got = ::pread(mFd, p, length, static_cast<off_t>(offset));
      if (got <= 0) return false;
      p += got;
      offset += static_cast<std::uint64_t>(got);
      length -= static_cast<std::size_t>(got);
    }
    return true;
  }

 private:
  static constexpr std::uint64_t kHeadSize = 64 * 1024;
  int mFd = -1;
  std::uint64_t mSize = 0;
  std::vector<char> mHead;
};

// Outcome of a walk: an empty problem means the file may be handed over.
struct Verdict {
  std::string problem;
  bool Refuse(const std::string& why) {
    if (problem.empty()) problem = why;
    return false;
  }
};

bool IsBlank(const std::vector<char>& bytes) {
  return std::all_of(bytes.begin(), bytes.end(),
                     [](char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n' || c == '\0'; });
}

// Scans one stored packet of known extent; an empty one is refused too: the
// file has XMP that a write would silently replace.
bool ScanStoredPacket(const Reader& file, std::uint64_t offset, std::uint64_t length, const char* where,
                      Verdict* verdict) {
  if (length > kMaxPacketBytes)
    return verdict->Refuse(std::string(where) + ": packet larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB");
  if (length <= kWholeRead) {
    // Small enough to check in one piece with the quick pass.
    std::vector<char> whole(static_cast<std::size_t>(length));
    if (!file.Read(offset, whole.data(), whole.size())) return verdict->Refuse(std::string(where) + ": truncated");
    if (IsBlank(whole)) return verdict->Refuse(std::string(where) + ": empty XMP");
    try {
      RequireSanePacket(whole.data(), whole.size());
    } catch (const XMP_Error& e) {
      return verdict->Refuse(std::string(where) + ": " + e.GetErrMsg());
    }
    return true;
  }
  PacketScanner scan;
  std::vector<char> piece;
  bool blank = true;
  std::uint64_t done = 0;
  do {
    const std::size_t part = static_cast<std::size_t>(std::min<std::uint64_t>(kReadPiece, length - done));
    piece.resize(part);
    if (!file.Read(offset + done, piece.data(), part)) return verdict->Refuse(std::string(where) + ": truncated");
    blank = blank && IsBlank(piece);
    std::size_t use = part;
    done += part;
    if (done == length) {
      while (use > 0 && piece[use - 1] == '\0') --use;  // padding
    }
    if (!scan.Feed(piece.data(), use, done == length))
      return verdict->Refuse(std::string(where) + (blank && done == length ? ": empty XMP" : ": " + scan.Problem()));
  } while (done < length);
  return true;
}

// ---- JPEG: segments up to the image data; standard and Extended XMP ----

const char kXMPSignature[] = "http://ns.adobe.com/xap/1.0/";             // + NUL
const char kExtendedSignature[] = "http://ns.adobe.com/xmp/extension/";  // + NUL

struct ExtendedChunk {
  std::uint32_t offset;
  std::uint64_t fileOffset;
  std::uint32_t length;
};

bool WalkJPEG(const Reader& file, Verdict* verdict) {
  struct Group {
    std::uint32_t fullLength = 0;
    std::vector<ExtendedChunk> chunks;
  };
  std::map<std::string, Group> extended;
  std::uint64_t pos = 2;
  std::uint64_t segments = 0;
  while (pos + 4 <= file.Size()) {
    unsigned char head[4];
    if (!file.Read(pos, head, 1) || head[0] != 0xFF) break;  // not a marker: image data or damage
    // A marker may be preceded by fill bytes; a long run of them is not a
    // JPEG the handler would get further in.
    int fill = 0;
    while (file.Read(pos + 1, head + 1, 1) && head[1] == 0xFF && ++fill < 64) ++pos;
    if (head[1] == 0xFF) break;
    const unsigned char marker = head[1];
    if (marker == 0xD9 || marker == 0xDA) break;
    if ((marker >= 0xD0 && marker <= 0xD7) || marker == 0x01 || marker == 0xD8) {
      pos += 2;
      continue;
    }
    if (++segments > kMaxBoxes) return verdict->Refuse("JPEG: too many segments");
    if (!file.Read(pos + 2, head + 2, 2)) break;
    const std::uint32_t length = (std::uint32_t(head[2]) << 8) | head[3];
    if (length < 2) return verdict->Refuse("JPEG: segment with a broken length");
    if (pos + 2 + length > file.Size()) break;  // truncated: the handler stops there too
    if (marker == 0xE1) {
      const std::uint64_t content = pos + 4;
      const std::uint32_t size = length - 2;
      unsigned char sig[sizeof(kExtendedSignature)] = {};
      const std::size_t have = std::min<std::size_t>(sizeof sig, size);
      if (!file.Read(content, sig, have)) break;
      if (have >= sizeof kXMPSignature && std::memcmp(sig, kXMPSignature, sizeof kXMPSignature) == 0) {
        if (!ScanStoredPacket(file, content + sizeof kXMPSignature, size - sizeof kXMPSignature, "JPEG XMP segment",
                              verdict))
          return false;
      } else if (have == sizeof kExtendedSignature &&
                 std::memcmp(sig, kExtendedSignature, sizeof kExtendedSignature) == 0) {
        constexpr std::uint32_t kHeader = sizeof kExtendedSignature + 32 + 4 + 4;
        if (size < kHeader) return verdict->Refuse("JPEG Extended XMP: segment too short");
        unsigned char fields[40];
        if (!file.Read(content + sizeof kExtendedSignature, fields, sizeof fields)) break;
        Group& group = extended[std::string(reinterpret_cast<char*>(fields), 32)];
        const std::uint32_t full = BE32(fields + 32);
        if (!group.chunks.empty() && group.fullLength != full)
          return verdict->Refuse("JPEG Extended XMP: chunks disagree on the length");
        group.fullLength = full;
        group.chunks.push_back({BE32(fields + 36), content + kHeader, size - kHeader});
      }
    }
    pos += 2 + length;
  }
  for (auto& entry : extended) {
    Group& group = entry.second;
    if (group.fullLength > kMaxPacketBytes)
      return verdict->Refuse("JPEG Extended XMP larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB");
    std::sort(group.chunks.begin(), group.chunks.end(),
              [](const ExtendedChunk& a, const ExtendedChunk& b) { return a.offset < b.offset; });
    // Only an exact tiling is a packet; anything else would be assembled
    // differently by us and by the handler.
    std::uint64_t expected = 0;
    for (const ExtendedChunk& chunk : group.chunks) {
      if (chunk.offset != expected) return verdict->Refuse("JPEG Extended XMP: chunks do not fit together");
      expected += chunk.length;
    }
    if (expected != group.fullLength) return verdict->Refuse("JPEG Extended XMP: incomplete");
    if (expected == 0) return verdict->Refuse("JPEG Extended XMP: empty XMP");
    PacketScanner scan;
    std::vector<char> piece;
    for (std::size_t i = 0; i < group.chunks.size(); ++i) {
      const ExtendedChunk& chunk = group.chunks[i];
      piece.resize(chunk.length);
      if (!file.Read(chunk.fileOffset, piece.data(), piece.size()))
        return verdict->Refuse("JPEG Extended XMP: truncated");
      if (!scan.Feed(piece.data(), piece.size(), i + 1 == group.chunks.size()))
        return verdict->Refuse("JPEG Extended XMP: " + scan.Problem());
    }
  }
  return true;
}

// ---- ISO media (MP4, QuickTime): the box tree ----

const unsigned char kXMPUuid[16] = {0xBE, 0x7A, 0xCF, 0xCB, 0x97, 0xA9, 0x42, 0xE8,
                                    0x9C, 0x71, 0x99, 0x94, 0x91, 0xE3, 0xAF, 0xAC};

bool IsBoxContainer(const std::string& type) {
  static const char* const kContainers[] = {"moov", "trak", "mdia", "minf", "stbl", "udta", "edts", "dinf",
                                            "mvex", "moof", "traf", "mfra", "tref", "ilst", "meta"};
  return std::any_of(std::begin(kContainers), std::end(kContainers), [&](const char* c) { return type == c; });
}

bool LooksLikeISOMedia(const Reader& file) {
  unsigned char head[8];
  if (file.Size() < 8 || !file.Read(0, head, 8)) return false;
  const std::string type(reinterpret_cast<char*>(head + 4), 4);
  static const char* const kFirst[] = {"ftyp", "moov", "mdat", "free", "skip", "wide", "pnot", "uuid"};
  return std::any_of(std::begin(kFirst), std::end(kFirst), [&](const char* c) { return type == c; });
}

bool WalkBoxes(const Reader& file, std::uint64_t pos, std::uint64_t end, int depth, std::uint64_t* boxes,
               Verdict* verdict) {
  if (depth > kMaxContainerDepth) return verdict->Refuse("boxes nested too deeply");
  while (pos < end) {
    if (end - pos < 8) {
      if (depth == 0) return true;  // trailing bytes after the last box
      return verdict->Refuse("box with a broken size");
    }
    unsigned char head[16];
    if (!file.Read(pos, head, 8)) return verdict->Refuse("box header cut short");
    const std::string type(reinterpret_cast<char*>(head + 4), 4);
    std::uint64_t size = BE32(head);
    std::uint64_t header = 8;
    if (size == 1) {
      if (end - pos < 16 || !file.Read(pos + 8, head + 8, 8)) return verdict->Refuse("box with a broken size");
      size = BE64(head + 8);
      header = 16;
    } else if (size == 0) {
      size = end - pos;  // runs to the end of its parent
    }
    if (size < header) return verdict->Refuse("box \"" + type + "\" with a broken size");
    if (size > end - pos) {
      // A cut-off download leaves the media data short; anything else that
      // overruns its parent is damage the handler would misread.
      if (depth == 0 && type == "mdat") return true;
      return verdict->Refuse("box \"" + type + "\" runs past its parent");
    }
    if (++*boxes > kMaxBoxes) return verdict->Refuse("too many boxes");
    const std::uint64_t body = pos + header;
    if (type == "uuid") {
      unsigned char uuid[16];
      if (size - header >= 16 && file.Read(body, uuid, 16) && std::memcmp(uuid, kXMPUuid, 16) == 0) {
        if (!ScanStoredPacket(file, body + 16, size - header - 16, "XMP box", verdict)) return false;
      }
    } else if (type == "XMP_") {
      if (!ScanStoredPacket(file, body, size - header, "XMP_ box", verdict)) return false;
    } else if (IsBoxContainer(type)) {
      std::uint64_t children = body;
      if (type == "meta" && size - header >= 4) {
        // An ISO meta box starts with version and flags; a QuickTime one
        // starts with its first child.
        unsigned char versionFlags[4];
        if (file.Read(body, versionFlags, 4) && BE32(versionFlags) == 0) children += 4;
      }
      if (!WalkBoxes(file, children, pos + size, depth + 1, boxes, verdict)) return false;
    }
    pos += size;
  }
  return true;
}

// ---- RIFF (WAV, AVI): the chunk tree ----

bool LooksLikeRIFF(const Reader& file) {
  unsigned char head[12];
  return file.Size() >= 12 && file.Read(0, head, 12) &&
         (std::memcmp(head, "RIFF", 4) == 0 || std::memcmp(head, "RF64", 4) == 0);
}

bool WalkChunks(const Reader& file, std::uint64_t pos, std::uint64_t end, int depth, std::uint64_t* chunks,
                Verdict* verdict) {
  if (depth > kMaxContainerDepth) return verdict->Refuse("chunks nested too deeply");
  while (pos + 8 <= end) {
    unsigned char head[12];
    if (!file.Read(pos, head, 8)) return true;
    const std::string id(reinterpret_cast<char*>(head), 4);
    std::uint64_t size = LE32(head + 4);
    if (id == "RF64" || (depth == 0 && size == 0xFFFFFFFFu)) size = end - pos - 8;  // real size kept elsewhere
    if (size > end - pos - 8) {
      // Recordings cut short are common: read what is there, as the handler does.
      size = end - pos - 8;
    }
    if (++*chunks > kMaxBoxes) return verdict->Refuse("too many chunks");
    if ((id == "RIFF" || id == "RF64" || id == "LIST") && size >= 4) {
      if (!WalkChunks(file, pos + 12, pos + 8 + size, depth + 1, chunks, verdict)) return false;
    } else if (id == "_PMX") {
      if (!ScanStoredPacket(file, pos + 8, size, "RIFF XMP chunk", verdict)) return false;
    }
    pos += 8 + size + (size & 1);
  }
  return true;
}

// ---- Anything else: packets found by their markers ----

// The length of the packet start at p, 0 when none starts there. UTF-16
// packets are taken as little-endian from their '<': a big-endian one read
// one byte late spells the same markup, which is all the scan looks at.
std::size_t PacketStartAt(const char* p, std::size_t available, bool* wide) {
  static const char* const kMarkers[] = {"<?xpacket begin", "<x:xmpmeta", "<x:xapmeta", "<rdf:RDF"};
  for (const char* marker : kMarkers) {
    const std::size_t n = std::strlen(marker);
    if (available >= n && std::memcmp(p, marker, n) == 0) {
      *wide = false;
      return n;
    }
  }
  // "<?xp" in UTF-16.
  static const char kLittle[] = {'<', 0, '?', 0, 'x', 0, 'p', 0};
  if (available >= sizeof kLittle && std::memcmp(p, kLittle, sizeof kLittle) == 0) {
    *wide = true;
    return sizeof kLittle;
  }
  return 0;
}

bool ScanForPackets(const Reader& file, Verdict* verdict) {
  std::vector<char> buffer;
  std::uint32_t packets = 0;
  std::uint64_t pos = 0;
  constexpr std::size_t kOverlap = 16;  // longer than any marker
  while (pos < file.Size()) {
    const std::size_t part = static_cast<std::size_t>(std::min<std::uint64_t>(kReadPiece, file.Size() - pos));
    buffer.resize(part);
    if (!file.Read(pos, buffer.data(), part)) return true;
    std::uint64_t next = pos + (part > kOverlap && pos + part < file.Size() ? part - kOverlap : part);
    for (std::size_t i = 0; i < part;) {
      const char* hit = static_cast<const char*>(std::memchr(buffer.data() + i, '<', part - i));
      if (!hit) break;
      std::size_t at = static_cast<std::size_t>(hit - buffer.data());
      bool wide = false;
      if (!PacketStartAt(hit, part - at, &wide)) {
        i = at + 1;
        continue;
      }
      if (++packets > kMaxPacketsPerFile) return verdict->Refuse("too many XMP packets");
      const std::uint64_t start = pos + at;
      PacketScanner scan;
      scan.StopAtRootEnd();
      std::vector<char> piece;
      std::uint64_t done = 0;
      while (!scan.Complete() && !scan.Refused()) {
        const std::uint64_t left = file.Size() - start - done;
        const std::size_t size = static_cast<std::size_t>(std::min<std::uint64_t>(kReadPiece, left));
        piece.resize(size);
        if (size > 0 && !file.Read(start + done, piece.data(), size)) return true;
        done += size;
        scan.Feed(piece.data(), size, done == file.Size() - start);
        if (size == 0) break;
      }
      if (scan.Refused()) return verdict->Refuse("XMP packet at byte " + std::to_string(start) + ": " + scan.Problem());
      const std::uint64_t resume = start + std::max<std::uint64_t>(scan.Consumed(), 1);
      if (resume >= pos + part) {
        next = resume;
        break;
      }
      i = static_cast<std::size_t>(resume - pos);
    }
    pos = std::max(next, pos + 1);
  }
  return true;
}

}  // namespace

bool MediaFileIsSane(const std::string& utf8Path, std::string* problem) {
  const Reader file(utf8Path);
  if (!file.Ok() || file.Size() == 0) return true;
  Verdict verdict;
  std::uint64_t boxes = 0;
  unsigned char head[2] = {};
  bool sane;
  if (file.Read(0, head, 2) && head[0] == 0xFF && head[1] == 0xD8) {
    sane = WalkJPEG(file, &verdict);
  } else if (LooksLikeISOMedia(file)) {
    sane = WalkBoxes(file, 0, file.Size(), 0, &boxes, &verdict);
  } else if (LooksLikeRIFF(file)) {
    sane = WalkChunks(file, 0, file.Size(), 0, &boxes, &verdict);
  } else {
    sane = ScanForPackets(file, &verdict);
  }
  if (!sane && problem) *problem = verdict.problem;
  return sane;
}

// ---------------------------------------------------------------------------
// Plain packets

namespace {

constexpr std::string_view kRdfURI = "http://www.w3.org/1999/02/22-rdf-syntax-ns#";

bool NameStart(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_'; }
bool NameChar(char c) { return NameStart(c) || (c >= '0' && c <= '9') || c == '-' || c == '.'; }

// An ASCII XML name with exactly one colon, split into prefix and local part.
bool SplitQName(std::string_view name, std::string_view* prefix, std::string_view* local) {
  const std::size_t colon = name.find(':');
  if (colon == std::string_view::npos || colon == 0 || colon + 1 >= name.size()) return false;
  *prefix = name.substr(0, colon);
  *local = name.substr(colon + 1);
  for (std::string_view part : {*prefix, *local}) {
    if (!NameStart(part[0])) return false;
    for (char c : part)
      if (!NameChar(c)) return false;
  }
  return true;
}

// Character data with only the predefined entities and references to
// characters XML allows.
bool PlainText(std::string_view text, bool attribute) {
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    if (c < 0x20 && c != '\t' && c != '\n' && c != '\r') return false;
    if (c == '<' || (attribute && c == '>')) return false;
    if (c == 0xEF && i + 2 < text.size() && static_cast<unsigned char>(text[i + 1]) == 0xBF &&
        static_cast<unsigned char>(text[i + 2]) >= 0xBE)
      return false;  // U+FFFE, U+FFFF
    if (c != '&') continue;
    const std::size_t semi = text.find(';', i);
    if (semi == std::string_view::npos) return false;
    const std::string_view entity = text.substr(i + 1, semi - i - 1);
    if (entity == "amp" || entity == "lt" || entity == "gt" || entity == "quot" || entity == "apos") {
      i = semi;
      continue;
    }
    if (entity.size() < 2 || entity[0] != '#' || entity.size() > 9) return false;
    const bool hex = entity[1] == 'x';
    const std::string_view digits = entity.substr(hex ? 2 : 1);
    if (digits.empty()) return false;
    std::uint32_t code = 0;
    for (char d : digits) {
      std::uint32_t v;
      if (d >= '0' && d <= '9') {
        v = static_cast<std::uint32_t>(d - '0');
      } else if (hex && d >= 'a' && d <= 'f') {
        v = static_cast<std::uint32_t>(d - 'a' + 10);
      } else if (hex && d >= 'A' && d <= 'F') {
        v = static_cast<std::uint32_t>(d - 'A' + 10);
      } else {
        return false;
      }
      code = code * (hex ? 16 : 10) + v;
    }
    const bool allowed = code == 0x9 || code == 0xA || code == 0xD || (code >= 0x20 && code <= 0xD7FF) ||
                         (code >= 0xE000 && code <= 0xFFFD) || (code >= 0x10000 && code <= 0x10FFFF);
    if (!allowed) return false;
    i = semi;
  }
  return true;
}

bool IsBlankText(std::string_view text) {
  return text.find_first_not_of(" \t\r\n") == std::string_view::npos;
}

// Names the toolkit treats as aliases of other properties: an alias beside
// its actual property may be dropped.
bool MaybeAlias(std::string_view uri, std::string_view local) {
  struct Alias {
    std::string_view uri;
    std::string_view local;  // empty: the whole namespace
  };
  static const Alias kAliases[] = {
      {"http://ns.adobe.com/pdf/1.3/", ""},
      {"http://ns.adobe.com/png/1.0/", ""},
      {"http://ns.adobe.com/xap/1.0/", "Author"},
      {"http://ns.adobe.com/xap/1.0/", "Authors"},
      {"http://ns.adobe.com/xap/1.0/", "Description"},
      {"http://ns.adobe.com/xap/1.0/", "Format"},
      {"http://ns.adobe.com/xap/1.0/", "Keywords"},
      {"http://ns.adobe.com/xap/1.0/", "Locale"},
      {"http://ns.adobe.com/xap/1.0/", "Title"},
      {"http://ns.adobe.com/xap/1.0/rights/", "Copyright"},
      {"http://ns.adobe.com/photoshop/1.0/", "Author"},
      {"http://ns.adobe.com/photoshop/1.0/", "Caption"},
      {"http://ns.adobe.com/photoshop/1.0/", "Copyright"},
      {"http://ns.adobe.com/photoshop/1.0/", "Keywords"},
      {"http://ns.adobe.com/photoshop/1.0/", "Title"},
      {"http://ns.adobe.com/tiff/1.0/", "Artist"},
      {"http://ns.adobe.com/tiff/1.0/", "Copyright"},
      {"http://ns.adobe.com/tiff/1.0/", "DateTime"},
      {"http://ns.adobe.com/tiff/1.0/", "ImageDescription"},
      {"http://ns.adobe.com/tiff/1.0/", "Software"},
  };
  for (const Alias& alias : kAliases)
    if (alias.uri == uri && (alias.local.empty() || alias.local == local)) return true;
  return false;
}

class PlainChecker {
 public:
  bool Run(std::string_view all) {
    mAll = all;
    std::size_t i = 0;
    while (i < all.size()) {
      const std::size_t lt = all.find('<', i);
      const std::string_view text = all.substr(i, (lt == std::string_view::npos ? all.size() : lt) - i);
      if (!Text(text)) return false;
      if (lt == std::string_view::npos) break;
      if (lt + 1 >= all.size()) return false;
      const char c = all[lt + 1];
      if (c == '?') {
        // Processing instructions only around the root: the packet wrapper.
        const std::size_t end = all.find("?>", lt);
        if (end == std::string_view::npos || !mFrames.empty()) return false;
        const bool wrapper = all.compare(lt + 2, 8, "xpacket ") == 0 || all.compare(lt + 2, 9, "xpacket?>") == 0;
        if (!wrapper && !(lt == 0 && all.compare(2, 4, "xml ") == 0)) return false;
        i = end + 2;
      } else if (c == '!') {
        return false;  // comments, CDATA, DOCTYPE
      } else if (c == '/') {
        const std::size_t gt = all.find('>', lt);
        if (gt == std::string_view::npos || mFrames.empty()) return false;
        std::string_view name = all.substr(lt + 2, gt - lt - 2);
        while (!name.empty() && (name.back() == ' ' || name.back() == '\t' || name.back() == '\r' ||
                                 name.back() == '\n'))
          name.remove_suffix(1);
        if (name != mFrames.back().name || !End()) return false;
        i = gt + 1;
      } else {
        std::size_t next = 0;
        if (!Start(lt, &next)) return false;
        i = next;
      }
    }
    return mFrames.empty() && mSawRDF;
  }

 private:
  enum class Kind { kRoot, kRDF, kTopDescription, kDescription, kProperty, kItem, kContainer, kResource };
  struct Frame {
    std::string_view name;
    Kind kind;
    std::size_t scope;                   // mScope size before this element's declarations
    std::vector<std::string_view> seen;  // property names, for duplicates
    int children = 0;
    bool text = false;
    bool lang = false;
  };

  std::string_view Resolve(std::string_view prefix) const {
    for (auto it = mScope.rbegin(); it != mScope.rend(); ++it)
      if (it->first == prefix) return it->second;
    return std::string_view();
  }

  bool Declare(std::string_view prefix, std::string_view uri) {
    if (uri.empty() || prefix.empty() || prefix == "xml" || prefix == "xmlns" || !NameStart(prefix[0])) return false;
    for (char c : prefix)
      if (!NameChar(c)) return false;
    // One URI per prefix and one prefix per URI, so that names compare as text.
    for (const auto& [p, u] : mBindings)
      if ((p == prefix) != (u == uri)) return false;
    mBindings.emplace_back(prefix, uri);
    mScope.emplace_back(prefix, uri);
    return true;
  }

  bool Text(std::string_view text) {
    if (text.empty()) return true;
    if (!PlainText(text, false)) return false;
    if (IsBlankText(text)) return true;
    if (mFrames.empty()) return false;
    Frame& frame = mFrames.back();
    if (frame.kind != Kind::kProperty && frame.kind != Kind::kItem) return false;
    frame.text = true;
    return frame.children == 0;
  }

  // A name of a property in node: bound, not an rdf: or xml: term, unique.
  bool Property(Frame* node, std::string_view qname, bool topLevel) {
    std::string_view prefix, local;
    if (!SplitQName(qname, &prefix, &local) || prefix == "xml") return false;
    const std::string_view uri = Resolve(prefix);
    if (uri.empty() || uri == kRdfURI) return false;
    if (topLevel && MaybeAlias(uri, local)) return false;
    std::vector<std::string_view>& seen = topLevel ? mTopLevel : node->seen;
    if (std::find(seen.begin(), seen.end(), qname) != seen.end()) return false;
    seen.push_back(qname);
    return true;
  }

  bool IsRdf(std::string_view qname, std::string_view local) const {
    std::string_view p, l;
    return SplitQName(qname, &p, &l) && l == local && Resolve(p) == kRdfURI;
  }

  bool Start(std::size_t lt, std::size_t* next) {
    const std::string_view all = mAll;
    std::size_t k = lt + 1;
    while (k < all.size() && !IsSpace(all[k]) && all[k] != '/' && all[k] != '>') ++k;
    if (k >= all.size()) return false;
    Frame frame;
    frame.name = all.substr(lt + 1, k - lt - 1);
    frame.scope = mScope.size();
    // Attributes: declarations first, since they apply to the element itself.
    std::vector<std::pair<std::string_view, std::string_view>> attributes;
    bool empty = false;
    for (;;) {
      const std::size_t before = k;
      while (k < all.size() && IsSpace(all[k])) ++k;
      if (k >= all.size()) return false;
      if (all[k] != '>' && all[k] != '/' && k == before) return false;  // attributes need space between
      if (all[k] == '>') {
        ++k;
        break;
      }
      if (all[k] == '/') {
        if (k + 1 >= all.size() || all[k + 1] != '>') return false;
        k += 2;
        empty = true;
        break;
      }
      const std::size_t nameStart = k;
      while (k < all.size() && all[k] != '=' && !IsSpace(all[k]) && all[k] != '>' && all[k] != '/') ++k;
      const std::string_view name = all.substr(nameStart, k - nameStart);
      if (k >= all.size() || all[k] != '=' || name.empty()) return false;
      ++k;
      if (k >= all.size() || (all[k] != '"' && all[k] != '\'')) return false;
      const std::size_t close = all.find(all[k], k + 1);
      if (close == std::string_view::npos) return false;
      const std::string_view value = all.substr(k + 1, close - k - 1);
      if (!PlainText(value, true)) return false;
      k = close + 1;
      for (const auto& a : attributes)
        if (a.first == name) return false;
      attributes.emplace_back(name, value);
      if (name.compare(0, 6, "xmlns:") == 0) {
        if (value.find('&') != std::string_view::npos || !Declare(name.substr(6), value)) return false;
      } else if (name == "xmlns") {
        return false;
      }
    }
    *next = k;
    std::string_view prefix, local;
    if (!SplitQName(frame.name, &prefix, &local) || Resolve(prefix).empty()) return false;
    Frame* parent = mFrames.empty() ? nullptr : &mFrames.back();
    if (parent) {
      if (parent->text) return false;
      ++parent->children;
    }
    const Kind parentKind = parent ? parent->kind : Kind::kRoot;
    bool resource = false, parseTypeResource = false;
    if (!parent) {
      if (local != "xmpmeta" || mSawRoot) return false;
      mSawRoot = true;
      frame.kind = Kind::kRoot;
    } else if (parentKind == Kind::kRoot) {
      if (!IsRdf(frame.name, "RDF") || mSawRDF) return false;
      mSawRDF = true;
      frame.kind = Kind::kRDF;
    } else if (parentKind == Kind::kRDF) {
      if (!IsRdf(frame.name, "Description")) return false;
      frame.kind = Kind::kTopDescription;
    } else if (parentKind == Kind::kContainer) {
      if (!IsRdf(frame.name, "li")) return false;
      frame.kind = Kind::kItem;
    } else if (parentKind == Kind::kProperty || parentKind == Kind::kItem) {
      if (parent->children > 1 || parent->lang) return false;
      if (IsRdf(frame.name, "Bag") || IsRdf(frame.name, "Seq") || IsRdf(frame.name, "Alt")) {
        frame.kind = Kind::kContainer;
      } else if (IsRdf(frame.name, "Description")) {
        frame.kind = Kind::kDescription;
      } else {
        return false;
      }
    } else {  // a node: kTopDescription, kDescription, kResource
      if (!Property(parent, frame.name, parentKind == Kind::kTopDescription)) return false;
      frame.kind = Kind::kProperty;
    }
    for (const auto& [name, value] : attributes) {
      if (name.compare(0, 6, "xmlns:") == 0) continue;
      if (frame.kind == Kind::kRoot) {
        std::string_view p, l;
        if (!SplitQName(name, &p, &l) || (p != "xml" && Resolve(p).empty())) return false;
      } else if (frame.kind == Kind::kTopDescription) {
        if (IsRdf(name, "about")) {
          if (mAbout && *mAbout != value) return false;
          mAbout = value;
        } else if (!Property(&frame, name, true)) {
          return false;
        }
      } else if (frame.kind == Kind::kDescription) {
        if (!Property(&frame, name, false)) return false;
      } else if (frame.kind == Kind::kProperty || frame.kind == Kind::kItem) {
        if (name == "xml:lang") {
          frame.lang = true;
        } else if (IsRdf(name, "resource")) {
          resource = true;
        } else if (IsRdf(name, "parseType") && value == "Resource") {
          parseTypeResource = true;
        } else {
          return false;
        }
      } else {
        return false;  // rdf:RDF and containers carry declarations only
      }
    }
    if (resource && (!empty || parseTypeResource)) return false;
    if (parseTypeResource) {
      if (frame.lang) return false;
      frame.kind = Kind::kResource;
    }
    if (empty) {
      mScope.resize(frame.scope);
      return frame.kind != Kind::kRoot && frame.kind != Kind::kRDF;
    }
    mFrames.push_back(std::move(frame));
    return mFrames.size() <= 64;
  }

  bool End() {
    mScope.resize(mFrames.back().scope);
    mFrames.pop_back();
    return true;
  }

  std::string_view mAll;
  std::vector<Frame> mFrames;
  std::vector<std::pair<std::string_view, std::string_view>> mScope;
  std::vector<std::pair<std::string_view, std::string_view>> mBindings;
  std::vector<std::string_view> mTopLevel;
  std::optional<std::string_view> mAbout;
  bool mSawRoot = false;
  bool mSawRDF = false;
};

}  // namespace

bool PacketIsPlainRDF(const char* buffer, std::size_t length) {
  while (length > 0 && (buffer[length - 1] == '\0')) --length;
  if (length == 0 || length > (1u << 20)) return false;
  if (!IsUTF8(reinterpret_cast<const unsigned char*>(buffer), length)) return false;
  PlainChecker checker;
  return checker.Run(std::string_view(buffer, length));
}


}  // namespace detail
}  // namespace ovraxmp
