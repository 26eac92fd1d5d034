// Not part of the interface: the packet object behind XMPMetaRef and the
// helpers that every source of the layer shares.
#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <vector>
#include <string>
#include <type_traits>
#include <utility>

#include <exempi/xmp.h>

#include <ovrametadata/XMPMetaRef.h>
#include <ovraxmp/XMPMeta.h>
#include <ovraxmp/XMPError.h>

namespace ovraxmp {
namespace detail {

// A top-level property: namespace URI and name with prefix ("dc:title").
struct TopLevel {
  std::string ns;
  std::string name;
};

// A top-level property with a text that is the same for two properties
// exactly when their subtrees are (names, values, options, qualifiers and
// items in order).
struct PropertyText {
  TopLevel key;
  std::string text;
};

}  // namespace detail

// One packet: the toolkit object, its reference count and the in-memory
// multi-value marks (namespace URI -> normalised property paths).
class XMPPacket {
 public:
  explicit XMPPacket(XmpPtr xmp) noexcept : mXmp(xmp) {}
  ~XMPPacket();
  XMPPacket(const XMPPacket&) = delete;
  XMPPacket& operator=(const XMPPacket&) = delete;

  XmpPtr Xmp() const { return mXmp; }
  // Swaps in another toolkit object (which the packet then owns).
  void ReplaceXmp(XmpPtr xmp) noexcept {
    if (mXmp) xmp_free(mXmp);
    mXmp = xmp;
    ++mVersion;
  }
  // Hands the toolkit object over; the packet is left empty-handed and may
  // only be destroyed.
  XmpPtr Detach() noexcept {
    ++mVersion;
    return std::exchange(mXmp, nullptr);
  }
  // The texts of its top-level properties (see PropertyText), kept until
  // the content changes.
  const std::vector<detail::PropertyText>& Texts();
  void AddRef() noexcept { mRefCount.fetch_add(1, std::memory_order_relaxed); }
  // True when this was the last reference (the caller deletes the packet).
  bool Release() noexcept { return mRefCount.fetch_sub(1, std::memory_order_acq_rel) == 1; }
  std::int32_t RefCount() const noexcept { return mRefCount.load(std::memory_order_relaxed); }

  std::map<std::string, std::set<std::string>>& Marks() { return mMarks; }
  const std::map<std::string, std::set<std::string>>& Marks() const { return mMarks; }

  // A tracked packet remembers what it was at its first change since
  // tracking began, so that only its changes are passed on: a packet handed
  // out by a file keeps its properties' texts (see XMPFiles), an aggregate
  // of several keeps a copy of itself (see XMPUtils::MultiFileDistribute).
  enum class Tracking { kNone, kProperties, kPacket };
  void TrackChanges(Tracking how) noexcept;
  Tracking Tracked() const noexcept { return mTracking; }
  // Every change of the content goes through here first.
  void BeforeChange();
  // What it was when tracking began; null while it has not changed.
  XmpPtr Baseline() const noexcept { return mBaseline; }
  const std::vector<detail::PropertyText>* BaselineProperties() const noexcept { return mBaselineTexts.get(); }
  void CopyOriginFrom(const XMPPacket& other);

  // The namespace last found registered for this packet (reads repeat it);
  // valid while its generation is the registry's.
  std::string mKnownNS;
  unsigned mKnownGeneration = ~0u;

 private:
  XmpPtr mXmp;
  std::atomic<std::int32_t> mRefCount{1};
  std::map<std::string, std::set<std::string>> mMarks;
  std::uint64_t mVersion = 0;  // counts changes of the content
  std::uint64_t mTextsVersion = ~std::uint64_t(0);
  std::vector<detail::PropertyText> mTexts;
  Tracking mTracking = Tracking::kNone;
  XmpPtr mBaseline = nullptr;
  std::unique_ptr<std::vector<detail::PropertyText>> mBaselineTexts;
};

namespace detail {

// Owners of the toolkit's file and iterator handles.
struct FileCloser {
  void operator()(XmpFilePtr file) const noexcept {
    xmp_files_close(file, XMP_CLOSE_NOOPTION);
    xmp_files_free(file);
  }
};
using FileHandle = std::unique_ptr<std::remove_pointer_t<XmpFilePtr>, FileCloser>;
struct IteratorFreer {
  void operator()(XmpIteratorPtr iterator) const noexcept { xmp_iterator_free(iterator); }
};
using IteratorHandle = std::unique_ptr<std::remove_pointer_t<XmpIteratorPtr>, IteratorFreer>;

// Owner of a toolkit string.
class XmpString {
 public:
  XmpString() : mStr(xmp_string_new()) {}
  ~XmpString() { xmp_string_free(mStr); }
  XmpString(const XmpString&) = delete;
  XmpString& operator=(const XmpString&) = delete;
  XmpStringPtr get() const { return mStr; }
  operator XmpStringPtr() const { return mStr; }
  std::string str() const { return std::string(xmp_string_cstr(mStr), xmp_string_len(mStr)); }

 private:
  XmpStringPtr mStr;
};

// Throws XMP_Error with the toolkit's last error id (fallbackId when the
// toolkit recorded none) and the standard text, prefixed by context.
[[noreturn]] void ThrowLastError(std::int32_t fallbackId, const std::string& context);
[[noreturn]] void Throw(std::int32_t id, const std::string& context);

// Starts the toolkit when nobody has yet (for clients that skip Initialize).
void EnsureStarted();

// Creates a packet with one reference; throws when the toolkit cannot.
XMPPacket* NewPacket(XmpPtr xmp);

// True when the namespace is registered with the toolkit. Positive answers
// are cached: registrations are never undone while the toolkit runs.
bool NamespaceKnown(const std::string& namespaceURI);
// The same, remembering the last positive answer in the packet.
bool NamespaceKnown(XMPPacket& packet, const std::string& namespaceURI);
// The prefix with colon into *prefix (when non-null); false when unregistered.
bool LookupPrefix(const std::string& namespaceURI, std::string* prefix);
// The registered prefix with colon; throws kXMPErr_BadSchema when none.
std::string RequirePrefix(const std::string& namespaceURI);
// Forgets the cache (the toolkit stopped).
void ForgetNamespaces();

// The path without a leading "prefix:" of its own namespace, so that
// "dc:title" and "title" name the same node in the multi-value marks.
std::string NormalizedPath(const std::string& schemaNS, const std::string& path);

// Calls visit(end) with the end of every ancestor of path, outermost first
// (the positions of '/' and '[' outside of brackets and quotes); stops when
// visit answers true.
template <typename Visit>
void ForEachAncestor(const std::string& path, Visit visit) {
  int depth = 0;
  bool quoted = false;
  for (std::size_t i = 0; i < path.size(); ++i) {
    const char c = path[i];
    if (quoted) {
      if (c == '"') quoted = false;
      continue;
    }
    if (c == '"') {
      quoted = true;
    } else if (c == ']') {
      --depth;
    } else if (c == '[' || c == '/') {
      if (depth == 0 && i > 0 && visit(i)) return;
      if (c == '[') ++depth;
    }
  }
}

// A deep copy of a toolkit object (the toolkit's own copy shares the tree).
XmpPtr DeepCopy(XmpPtr xmp);

// A packet that is not null, else kXMPErr_BadObject.
XMPPacket& Require(XMPMetaRef ref);

// A holder of a toolkit object another packet owns, for reading it through
// the holder's operations while this object lives.
class BorrowedPacket {
 public:
  explicit BorrowedPacket(XmpPtr xmp);
  ~BorrowedPacket();
  BorrowedPacket(const BorrowedPacket&) = delete;
  BorrowedPacket& operator=(const BorrowedPacket&) = delete;
  const XMPMeta& Meta() const { return *mMeta; }

 private:
  XMPPacket* mPacket;
  XMPMeta* mMeta;
};

// Parses text into meta without the packet checks, for text that passed
// them already or that the toolkit itself wrote. Throws XMP_Error.
void ParseUnchecked(XMPMeta& meta, const std::string& text);

}  // namespace detail
}  // namespace ovraxmp
