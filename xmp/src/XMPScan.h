// Not part of the interface: the checks that keep hostile XML and media
// files away from the toolkit, whose parser recurses per element, whose
// property lists grow by linear search and whose file handlers trust sizes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

namespace ovraxmp {
namespace detail {

// Bounds on what the toolkit is given to parse. Real packets stay far below:
// a few dozen levels, a few thousand items in the largest array, a few MB.
constexpr int kMaxNestingDepth = 512;
constexpr std::uint32_t kMaxPropertiesPerNode = 50000;
constexpr std::uint64_t kMaxPacketBytes = 256ull << 20;

// A streaming expat pass over one XML document that stops at the first
// problem: nesting or properties per node above the bounds, more bytes than
// kMaxPacketBytes, a DOCTYPE (entities are where the billion laughs live),
// malformed XML or invalid UTF-8. Properties of one node are its child
// elements and its attributes; the properties of every top-level
// rdf:Description count together, since the toolkit merges them into one
// schema node.
class PacketScanner {
 public:
  PacketScanner();
  ~PacketScanner();
  PacketScanner(const PacketScanner&) = delete;
  PacketScanner& operator=(const PacketScanner&) = delete;

  // Feeds the next bytes; last marks the end of the input. Answers false
  // once the document is refused. With stopAtRootEnd, the scan ends
  // successfully when the root element closes (whatever follows in the
  // buffer, e.g. binary file data, is not looked at): Complete() then
  // answers true.
  bool Feed(const char* data, std::size_t length, bool last);
  void StopAtRootEnd() { mStopAtRootEnd = true; }
  bool Complete() const { return mComplete; }
  bool Refused() const { return !mProblem.empty(); }
  // Why the document was refused; empty while it was not.
  const std::string& Problem() const { return mProblem; }
  // The number of input bytes consumed up to where the scan stopped.
  std::uint64_t Consumed() const;

 private:
  struct State;
  std::unique_ptr<State> mState;
  std::string mProblem;
  bool mStopAtRootEnd = false;
  bool mComplete = false;
};

// Throws kXMPErr_BadXML when the buffer is refused by a PacketScanner.
void RequireSanePacket(const char* buffer, std::size_t length);

// True when the packet keeps to the plain shapes writers produce, which the
// toolkit parses without dropping anything: an x:xmpmeta holding rdf:RDF
// with rdf:Description nodes; properties as attributes or elements holding
// text, an rdf:resource, an rdf:Bag/Seq/Alt of rdf:li, an rdf:Description
// or rdf:parseType="Resource"; xml:lang on simple values; no duplicate,
// aliased or unbound names, no other rdf: terms, comments, CDATA, DOCTYPE
// or unknown entities. False means only that the packet needs the
// toolkit's own parse to tell.
bool PacketIsPlainRDF(const char* buffer, std::size_t length);

// Looks at the XMP a media file carries before the toolkit's handlers open
// it: JPEG segments (standard and Extended XMP), the box tree of ISO media
// files (MP4, QuickTime), the chunk tree of RIFF files (WAV, AVI), and any
// other file's packets found by their markers. Answers false with the
// reason in *problem when the file must not be handed to the toolkit:
// refused packets, XMP that exists but is empty, Extended XMP larger than
// the bounds, boxes or chunks nested too deeply or with sizes that leave
// their parent. Reads the file in bounded pieces; a file that cannot be
// read answers true (the toolkit then fails on it by itself).
bool MediaFileIsSane(const std::string& utf8Path, std::string* problem);

}  // namespace detail
}  // namespace ovraxmp
