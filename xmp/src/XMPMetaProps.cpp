// Packet content: parse, serialise, and the property, array, field,
// qualifier and localised-text operations. Every call tests registration
// and node kind first, because the toolkit reports its failures on stderr.
#include <algorithm>
#include <cctype>
#include <string>

#include <ovraxmp/XMPMeta.h>
#include <ovraxmp/XMPUtils.h>

#include "ToolkitOutput.h"
#include "XMPNodeTree.h"
#include "XMPPacket.h"
#include "files/PacketScan.h"

namespace ovraxmp {
namespace {

using detail::XmpString;

XmpPtr X(XMPMetaRef ref) { return detail::Require(ref).Xmp(); }

// The packet about to change.
XmpPtr W(XMPMetaRef ref) {
  XMPPacket& packet = detail::Require(ref);
  packet.BeforeChange();
  return packet.Xmp();
}

[[noreturn]] void Fail(const std::string& what, const std::string& ns, const std::string& path) {
  detail::ThrowLastError(kXMPErr_InternalFailure, what + " \"" + path + "\" in \"" + ns + "\"");
}

bool RawOptions(XmpPtr xmp, const std::string& ns, const std::string& path, XMP_OptionBits* options) {
  std::uint32_t bits = 0;
  if (!xmp_get_property(xmp, ns.c_str(), path.c_str(), nullptr, &bits)) {
    if (xmp_get_error() != 0) Fail("reading", ns, path);
    return false;
  }
  *options = bits;
  return true;
}

// The toolkit complains on stderr when a path steps into a node of the
// wrong kind (a field of a simple value, an item of a structure), which
// real files with unexpected shapes make ordinary. So the ancestors of a
// composite path are checked first: a wrong kind raises kXMPErr_BadXPath
// here; a missing ancestor is reported through *missingStep (the character
// of the step below it), or 0 when every ancestor exists.
void CheckAncestors(XmpPtr xmp, const std::string& ns, const std::string& path, char* missingStep) {
  *missingStep = 0;
  if (path.find_first_of("/[") == std::string::npos) return;
  detail::ForEachAncestor(path, [&](std::size_t end) {
    XMP_OptionBits options = 0;
    const std::string ancestor = path.substr(0, end);
    if (!RawOptions(xmp, ns, ancestor, &options)) {
      *missingStep = path[end];
      return true;
    }
    const bool item = path[end] == '[';
    const bool qualifier = path[end] == '/' && end + 1 < path.size() && path[end + 1] == '?';
    if (item && !(options & kXMP_PropValueIsArray))
      detail::Throw(kXMPErr_BadXPath, "\"" + ancestor + "\" is not an array");
    if (!item && !qualifier && !(options & kXMP_PropValueIsStruct))
      detail::Throw(kXMPErr_BadXPath, "\"" + ancestor + "\" is not a structure");
    return false;
  });
}

// Options of an existing node; false when absent or its namespace unknown.
bool NodeOptions(XmpPtr xmp, const std::string& ns, const std::string& path, XMP_OptionBits* options) {
  if (!detail::NamespaceKnown(ns)) return false;
  char missing = 0;
  CheckAncestors(xmp, ns, path, &missing);
  if (missing) return false;
  return RawOptions(xmp, ns, path, options);
}

void RequireArray(XmpPtr xmp, const std::string& ns, const std::string& arrayName, bool* exists,
                  XMP_OptionBits* form = nullptr) {
  XMP_OptionBits options = 0;
  *exists = NodeOptions(xmp, ns, arrayName, &options);
  if (*exists && !(options & kXMP_PropValueIsArray))
    detail::Throw(kXMPErr_BadXPath, "\"" + arrayName + "\" is not an array");
  if (form) *form = options;
}

// Aliases the toolkit registers whose actual property is an array. The
// toolkit resolves a bare alias to one item (the "x-default" text, the
// first creator), so the kind checks of array and language-alternative
// operations, and paths that step below the alias, would see the item and
// refuse; those are taken to the actual array instead.
struct ArrayAlias {
  const char* ns;
  const char* name;
  const char* actualNS;
  const char* actualName;
};

const char kNS_PDF[] = "http://ns.adobe.com/pdf/1.3/";
const char kNS_PNG[] = "http://ns.adobe.com/png/1.0/";

const ArrayAlias kArrayAliases[] = {
    {kXMP_NS_XMP, "Authors", kXMP_NS_DC, "creator"},
    {kXMP_NS_XMP, "Description", kXMP_NS_DC, "description"},
    {kXMP_NS_XMP, "Keywords", kXMP_NS_DC, "subject"},
    {kXMP_NS_XMP, "Locale", kXMP_NS_DC, "language"},
    {kXMP_NS_XMP, "Title", kXMP_NS_DC, "title"},
    {kXMP_NS_XMP_Rights, "Copyright", kXMP_NS_DC, "rights"},
    {kNS_PDF, "Subject", kXMP_NS_DC, "description"},
    {kNS_PDF, "Title", kXMP_NS_DC, "title"},
    {kXMP_NS_Photoshop, "Caption", kXMP_NS_DC, "description"},
    {kXMP_NS_Photoshop, "Copyright", kXMP_NS_DC, "rights"},
    {kXMP_NS_Photoshop, "Keywords", kXMP_NS_DC, "subject"},
    {kXMP_NS_Photoshop, "Title", kXMP_NS_DC, "title"},
    {kXMP_NS_TIFF, "Copyright", kXMP_NS_DC, "rights"},
    {kXMP_NS_TIFF, "ImageDescription", kXMP_NS_DC, "description"},
    {kNS_PNG, "Copyright", kXMP_NS_DC, "rights"},
    {kNS_PNG, "Description", kXMP_NS_DC, "description"},
    {kNS_PNG, "Title", kXMP_NS_DC, "title"},
};

// True (with the actual namespace and path) when path starts with an array
// alias; with belowOnly, only when the path steps below it.
bool ResolveArrayAlias(const std::string& ns, const std::string& path, bool belowOnly, std::string* actualNS,
                       std::string* actualPath) {
  const std::size_t stop = path.find_first_of("/[");
  if (belowOnly && stop == std::string::npos) return false;
  const ArrayAlias* candidate = nullptr;
  for (const ArrayAlias& alias : kArrayAliases) {
    if (ns == alias.ns) {
      candidate = &alias;
      break;
    }
  }
  if (!candidate) return false;
  const std::string first = detail::NormalizedPath(ns, path.substr(0, stop));
  for (const ArrayAlias* alias = candidate; alias != std::end(kArrayAliases) && ns == alias->ns; ++alias) {
    if (first == alias->name) {
      *actualNS = alias->actualNS;
      *actualPath = alias->actualName + (stop == std::string::npos ? std::string() : path.substr(stop));
      return true;
    }
  }
  return false;
}

// The implied form bits: alt-text is an alternative is ordered is an array.
XMP_OptionBits WithImpliedBits(XMP_OptionBits options) {
  if (options & kXMP_PropArrayIsAltText) options |= kXMP_PropArrayIsAlternate;
  if (options & kXMP_PropArrayIsAlternate) options |= kXMP_PropArrayIsOrdered;
  if (options & kXMP_PropArrayIsOrdered) options |= kXMP_PropValueIsArray;
  return options;
}

void CheckIndex(XMP_Index index) {
  if (index == 0 || index < kXMP_ArrayLastItem) detail::Throw(kXMPErr_BadIndex, "array index " + std::to_string(index));
}

// A bare rdf:RDF (no x:xmpmeta around it) gets the wrapper the toolkit wants.
std::string WrapBareRDF(const char* buffer, std::size_t length) {
  const std::string text(buffer, length);
  std::size_t open = 0;
  while ((open = text.find('<', open)) != std::string::npos &&
         open + 1 < text.size() && (text[open + 1] == '?' || text[open + 1] == '!')) {
    ++open;
  }
  if (open == std::string::npos) return text;
  std::size_t close = text.rfind("<?xpacket");
  if (close == std::string::npos || close < open) close = text.size();
  return text.substr(0, open) + "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\">" + text.substr(open, close - open) +
         "</x:xmpmeta>" + text.substr(close);
}

// Typed reads are text reads plus the toolkit's conversion; a text that does
// not convert raises bad-value.
template <class Convert>
auto GetConverted(const XMPMeta& meta, const std::string& ns, const std::string& name, Convert convert)
    -> std::optional<decltype(convert(std::string()))> {
  const std::optional<XMP_Node> node = meta.GetProperty(ns, name);
  if (!node) return std::nullopt;
  return convert(node->value);
}

}  // namespace

namespace detail {

namespace {

bool SameLanguage(const std::string& a, const std::string& b) {
  return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](char x, char y) {
           return std::tolower(static_cast<unsigned char>(x)) == std::tolower(static_cast<unsigned char>(y));
         });
}

std::string LocalName(const std::string& path) {
  const auto slash = path.rfind('/');
  const std::string last = slash == std::string::npos ? path : path.substr(slash + 1);
  return last.substr(last.find(':') + 1);
}

}  // namespace

// Language alternatives of exactly two items, "x-default" and another, in
// document order: the toolkit's reader and serialiser give the other item
// the default's text.
struct TwoItemAlternative {
  std::string ns, path;
  int other = 0;  // 1-based index of the item that is not "x-default"
  std::string language, defaultText, text;
};

std::vector<TwoItemAlternative> TwoItemAlternatives(XmpPtr xmp) {
  std::vector<TwoItemAlternative> found;
  std::vector<std::pair<std::string, std::string>> arrays;  // namespace, path
  {
    XmpIteratorPtr walk = xmp_iterator_new(xmp, nullptr, nullptr, XMP_ITER_OMITQUALIFIERS);
    if (!walk) return found;
    XmpString ns, path, value;
    uint32_t options = 0;
    while (xmp_iterator_next(walk, ns, path, value, &options)) {
      if (options & kXMP_PropArrayIsAltText) arrays.emplace_back(ns.str(), path.str());
    }
    xmp_iterator_free(walk);
  }
  for (auto& array : arrays) {
    const char* ns = array.first.c_str();
    const std::string& path = array.second;
    if (!xmp_has_property(xmp, ns, (path + "[2]").c_str()) || xmp_has_property(xmp, ns, (path + "[3]").c_str()))
      continue;
    std::string languages[2], texts[2];
    XmpString text;
    uint32_t options = 0;
    for (int i = 0; i < 2; ++i) {
      const std::string item = path + "[" + std::to_string(i + 1) + "]";
      if (xmp_get_property(xmp, ns, (item + "/?xml:lang").c_str(), text, &options)) languages[i] = text.str();
      if (xmp_get_property(xmp, ns, item.c_str(), text, &options)) texts[i] = text.str();
    }
    const int other = languages[0] == "x-default" ? 1 : 0;
    if (languages[1 - other] != "x-default" || languages[other] == "x-default") continue;
    found.push_back({std::move(array.first), std::move(array.second), other + 1, languages[other],
                     texts[1 - other], texts[other]});
  }
  return found;
}

bool AnyEqual(const std::vector<TwoItemAlternative>& alternatives) {
  return std::any_of(alternatives.begin(), alternatives.end(),
                     [](const TwoItemAlternative& alt) { return alt.text == alt.defaultText; });
}

void RestoreTwoLanguageAlternatives(XmpPtr xmp, std::vector<TwoLanguageAlternative> written) {
  written.erase(std::remove_if(written.begin(), written.end(),
                               [](const TwoLanguageAlternative& w) { return w.text == w.defaultText; }),
                written.end());
  if (written.empty()) return;
  for (const TwoItemAlternative& alt : TwoItemAlternatives(xmp)) {
    if (alt.text != alt.defaultText) continue;
    const std::string name = LocalName(alt.path);
    const auto found = std::find_if(written.begin(), written.end(), [&](const TwoLanguageAlternative& w) {
      return w.name == name && w.defaultText == alt.text && SameLanguage(w.language, alt.language);
    });
    if (found == written.end()) continue;
    xmp_set_array_item(xmp, alt.ns.c_str(), alt.path.c_str(), alt.other, found->text.c_str(), 0);
    written.erase(found);
  }
}

namespace {

// A parse of text the layer has checked before, repaired as ParseFromBuffer
// repairs: the scan runs only when the parse left equal texts behind.
void RepairParsed(XmpPtr xmp, std::string_view text) {
  if (!AnyEqual(TwoItemAlternatives(xmp))) return;
  std::vector<TwoLanguageAlternative> written;
  if (ScanPacket(text, nullptr, nullptr, nullptr, &written)) RestoreTwoLanguageAlternatives(xmp, std::move(written));
}

// Gives the other items their texts again (the serialiser overwrites them
// in the packet it writes out, too).
void PutBack(XmpPtr xmp, const std::vector<TwoItemAlternative>& alternatives) {
  XmpString now;
  uint32_t options = 0;
  for (const TwoItemAlternative& alt : alternatives) {
    const std::string item = alt.path + "[" + std::to_string(alt.other) + "]";
    if (alt.text != alt.defaultText && xmp_get_property(xmp, alt.ns.c_str(), item.c_str(), now, &options) &&
        now.str() != alt.text)
      xmp_set_array_item(xmp, alt.ns.c_str(), alt.path.c_str(), alt.other, alt.text.c_str(), 0);
  }
}

std::string EscapedContent(const std::string& text) {
  std::string out;
  for (const char c : text) {
    switch (c) {
      case '&': out += "&amp;"; break;
      case '<': out += "&lt;"; break;
      case '>': out += "&gt;"; break;
      case '\r': out += "&#xD;"; break;
      default: out += c;
    }
  }
  return out;
}

// Puts the other items' texts into what the serialiser wrote. An exact
// length is kept by taking the difference from the padding.
void PatchSerialized(const std::vector<TwoItemAlternative>& alternatives, std::string& text, bool exactLength) {
  std::vector<TwoLanguageAlternative> written;
  if (!ScanPacket(text, nullptr, nullptr, nullptr, &written) || written.size() != alternatives.size())
    Throw(kXMPErr_BadSerialize, "serialising a language alternative");
  std::ptrdiff_t grown = 0;
  for (std::size_t i = alternatives.size(); i-- > 0;) {
    const TwoItemAlternative& alt = alternatives[i];
    const TwoLanguageAlternative& w = written[i];
    if (w.text == alt.text) continue;
    if (w.textBegin == w.textEnd && !w.text.empty()) Throw(kXMPErr_BadSerialize, "serialising a language alternative");
    const std::string content = EscapedContent(alt.text);
    text.replace(w.textBegin, w.textEnd - w.textBegin, content);
    grown += static_cast<std::ptrdiff_t>(content.size()) - static_cast<std::ptrdiff_t>(w.textEnd - w.textBegin);
  }
  if (!exactLength || grown == 0) return;
  const std::size_t trailer = text.rfind("<?xpacket end=");
  if (trailer == std::string::npos) Throw(kXMPErr_BadSerialize, "the packet does not fit its length");
  std::size_t padding = trailer;
  while (padding > 0 && (text[padding - 1] == ' ' || text[padding - 1] == '\n')) --padding;
  if (grown < 0) {
    text.insert(padding, static_cast<std::size_t>(-grown), ' ');
    return;
  }
  std::size_t removed = 0;
  for (std::size_t at = trailer; at-- > padding && removed < static_cast<std::size_t>(grown);) {
    if (text[at] == ' ') {
      text.erase(at, 1);
      ++removed;
    }
  }
  if (removed < static_cast<std::size_t>(grown)) Throw(kXMPErr_BadSerialize, "the packet does not fit its length");
}

}  // namespace

// The toolkit's serialiser, which gives the other item of a two-item
// language alternative the default's text, in what it writes and in the
// packet itself: both are put right.
bool Serialize(XmpPtr xmp, std::string* out, XMP_OptionBits options, std::uint32_t padding,
               const std::string& newline, const std::string& indent, std::int32_t baseIndent) {
  const std::vector<TwoItemAlternative> alternatives = TwoItemAlternatives(xmp);
  XmpString text;
  // A packet that does not fit its length is an error the caller gets; the
  // toolkit's own text about it is not for the terminal.
  const ToolkitOutput quiet;
  const bool ok = (newline.empty() && indent.empty() && baseIndent == 0)
                      ? xmp_serialize(xmp, text, options, padding)
                      : xmp_serialize_and_format(xmp, text, options, padding, newline.c_str(), indent.c_str(),
                                                 baseIndent);
  const bool differ = std::any_of(alternatives.begin(), alternatives.end(),
                                  [](const TwoItemAlternative& a) { return a.text != a.defaultText; });
  if (differ) PutBack(xmp, alternatives);
  if (!ok) return false;
  *out = text.str();
  if (differ) PatchSerialized(alternatives, *out, (options & kXMP_ExactPacketLength) != 0);
  return true;
}

XmpPtr DeepCopy(XmpPtr xmp) {
  std::string text;
  if (!Serialize(xmp, &text, kXMP_OmitPacketWrapper | kXMP_UseCompactFormat | kXMP_OmitAllFormatting, 0, {}, {}, 0))
    ThrowLastError(kXMPErr_BadSerialize, "copying an XMP packet");
  XmpPtr copy = xmp_new_empty();
  if (!copy) ThrowLastError(kXMPErr_NoMemory, "copying an XMP packet");
  if (!xmp_parse(copy, text.data(), text.size())) {
    const int id = xmp_get_error();
    xmp_free(copy);
    Throw(id != 0 ? id : kXMPErr_BadParse, "copying an XMP packet");
  }
  RepairParsed(copy, text);
  return copy;
}

BorrowedPacket::BorrowedPacket(XmpPtr xmp) : mPacket(NewPacket(xmp)), mMeta(new XMPMeta(mPacket)) {}

BorrowedPacket::~BorrowedPacket() {
  mPacket->Detach();
  delete mMeta;
  XMPMetaRefRelease(mPacket);
}

void ParseUnchecked(XMPMeta& meta, const std::string& text) {
  XMPPacket& packet = Require(meta.GetInternalRef());
  XmpPtr fresh = xmp_new_empty();
  if (!fresh) ThrowLastError(kXMPErr_NoMemory, "creating an XMP packet");
  if (!text.empty() && !xmp_parse(fresh, text.data(), text.size())) {
    const int id = xmp_get_error();
    xmp_free(fresh);
    Throw(id != 0 ? id : kXMPErr_BadParse, "parsing XMP");
  }
  if (!text.empty()) RepairParsed(fresh, text);
  packet.BeforeChange();
  packet.ReplaceXmp(fresh);
  packet.Marks().clear();
}
}  // namespace detail

XMPPacket::~XMPPacket() {
  if (mXmp) xmp_free(mXmp);
  if (mBaseline) xmp_free(mBaseline);
}

void XMPPacket::TrackChanges(Tracking how) noexcept {
  mTracking = how;
  if (mBaseline) xmp_free(mBaseline);
  mBaseline = nullptr;
  mBaselineTexts.reset();
}

const std::vector<detail::PropertyText>& XMPPacket::Texts() {
  if (mTextsVersion != mVersion) {
    const detail::BorrowedPacket self(mXmp);
    mTexts = detail::PropertyTexts(self.Meta());
    mTextsVersion = mVersion;
  }
  return mTexts;
}

void XMPPacket::BeforeChange() {
  if (mTracking == Tracking::kPacket && !mBaseline) mBaseline = detail::DeepCopy(mXmp);
  if (mTracking == Tracking::kProperties && !mBaselineTexts)
    mBaselineTexts = std::make_unique<std::vector<detail::PropertyText>>(Texts());
  ++mVersion;
}

void XMPPacket::CopyOriginFrom(const XMPPacket& other) {
  TrackChanges(other.mTracking);
  if (other.mBaseline) mBaseline = detail::DeepCopy(other.mBaseline);
  if (other.mBaselineTexts) mBaselineTexts = std::make_unique<std::vector<detail::PropertyText>>(*other.mBaselineTexts);
}

// ---- whole packet ----

void XMPMeta::ParseFromBuffer(const char* buffer, std::size_t length, XMP_OptionBits options) {
  XMPPacket& packet = detail::Require(mRef);
  XmpPtr fresh = xmp_new_empty();
  if (!fresh) detail::ThrowLastError(kXMPErr_NoMemory, "creating an XMP packet");
  bool ok = true;
  std::vector<detail::TwoLanguageAlternative> alternatives;
  if (buffer && length > 0) {
    const std::string_view view(buffer, length);
    std::string wrapped;
    if (!(options & kXMP_RequireXMPMeta) && view.find("xmpmeta") == std::string_view::npos &&
        view.find("rdf:RDF") != std::string_view::npos) {
      wrapped = WrapBareRDF(buffer, length);
      buffer = wrapped.data();
      length = wrapped.size();
    }
    // The toolkit's RDF reader recurses per element and searches a node's
    // properties linearly: absurd nesting or property counts are refused
    // first (malformed XML too, which it would refuse after complaining on
    // stderr).
    std::string problem;
    bool refused = true;
    if (!detail::ScanPacket(std::string_view(buffer, length), &problem, nullptr, &refused, &alternatives)) {
      xmp_free(fresh);
      // Malformed XML is what the toolkit's own readers cope with; what the
      // check refuses (nesting, sizes, DOCTYPE) they must never see.
      detail::Throw(refused ? kXMPErr_BadXMP : kXMPErr_BadXML, "parsing XMP: " + problem);
    }
    ok = xmp_parse(fresh, buffer, length);
    // The toolkit's reader copies the default text over the other item of
    // a two-item language alternative.
    if (ok && !alternatives.empty()) detail::RestoreTwoLanguageAlternatives(fresh, std::move(alternatives));
  }
  if (!ok) {
    const int id = xmp_get_error();
    xmp_free(fresh);
    detail::Throw(id != 0 ? id : kXMPErr_BadParse, "parsing XMP");
  }
  packet.BeforeChange();
  packet.ReplaceXmp(fresh);
  packet.Marks().clear();
}

void XMPMeta::ParseFromBuffer(const std::string& buffer, XMP_OptionBits options) {
  ParseFromBuffer(buffer.data(), buffer.size(), options);
}

std::string XMPMeta::SerializeToBuffer(XMP_OptionBits options, std::uint32_t padding, const std::string& newline,
                                       const std::string& indent, std::int32_t baseIndent) const {
  XmpPtr xmp = X(mRef);
  XmpPtr toWrite = xmp;
  // Transient data stays in memory: write a copy without it.
  if (detail::NamespaceKnown(kXMP_NS_Transient)) {
    XmpIteratorPtr it = xmp_iterator_new(xmp, kXMP_NS_Transient, nullptr, XMP_ITER_JUSTCHILDREN);
    const bool hasTransient = it && xmp_iterator_next(it, nullptr, nullptr, nullptr, nullptr);
    if (it) xmp_iterator_free(it);
    if (hasTransient) {
      toWrite = detail::DeepCopy(xmp);
      XMPMeta copy(detail::NewPacket(toWrite));
      XMPMetaRefRelease(copy.GetInternalRef());  // the holder keeps the only reference
      XMPUtils::RemoveProperties(&copy, kXMP_NS_Transient, std::string(), kXMPUtil_DoAllProperties);
      return copy.SerializeToBuffer(options, padding, newline, indent, baseIndent);
    }
  }
  std::string out;
  if (!detail::Serialize(toWrite, &out, options, padding, newline, indent, baseIndent))
    detail::ThrowLastError(kXMPErr_BadSerialize, "serialising XMP");
  return out;
}

XMPMeta XMPMeta::Clone(XMP_OptionBits) const {
  XMPPacket& packet = detail::Require(mRef);
  XmpPtr copy = detail::DeepCopy(packet.Xmp());
  XMPPacket* clone = detail::NewPacket(copy);
  clone->Marks() = packet.Marks();
  clone->CopyOriginFrom(packet);
  XMPMeta result(clone);
  XMPMetaRefRelease(clone);
  return result;
}

void XMPMeta::Erase() {
  XMPPacket& packet = detail::Require(mRef);
  XmpPtr fresh = xmp_new_empty();
  if (!fresh) detail::ThrowLastError(kXMPErr_NoMemory, "creating an XMP packet");
  packet.BeforeChange();
  packet.ReplaceXmp(fresh);
  packet.Marks().clear();
}

// ---- simple properties ----

std::optional<XMP_Node> XMPMeta::GetProperty(const std::string& nsIn, const std::string& nameIn) const {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, nameIn, true, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& name = aliased ? aliasPath : nameIn;
  XMPPacket& packet = detail::Require(mRef);
  XmpPtr xmp = packet.Xmp();
  if (!detail::NamespaceKnown(packet, ns)) return std::nullopt;
  char missing = 0;
  CheckAncestors(xmp, ns, name, &missing);
  if (missing) return std::nullopt;
  XmpString text;
  std::uint32_t bits = 0;
  if (!xmp_get_property(xmp, ns.c_str(), name.c_str(), text, &bits)) {
    if (xmp_get_error() != 0) Fail("reading", ns, name);
    return std::nullopt;
  }
  return XMP_Node{text.str(), bits};
}

void XMPMeta::SetProperty(const std::string& nsIn, const std::string& nameIn, const std::string& value,
                          XMP_OptionBits options) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, nameIn, true, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& name = aliased ? aliasPath : nameIn;
  XmpPtr xmp = W(mRef);
  detail::RequirePrefix(ns);
  options = WithImpliedBits(options);
  XMP_OptionBits existing = 0;
  char missing = 0;
  CheckAncestors(xmp, ns, name, &missing);
  if (missing == '[') detail::Throw(kXMPErr_BadXPath, "the array of \"" + name + "\" does not exist");
  if (!(options & (kXMP_PropCompositeMask | kXMP_DeleteExisting)) && RawOptions(xmp, ns, name, &existing) &&
      (existing & kXMP_PropCompositeMask))
    detail::Throw(kXMPErr_BadXPath, "\"" + name + "\" is a structure or array and has no value of its own");
  if (!xmp_set_property(xmp, ns.c_str(), name.c_str(), value.c_str(), options)) Fail("writing", ns, name);
}

void XMPMeta::DeleteProperty(const std::string& nsIn, const std::string& nameIn) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, nameIn, true, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& name = aliased ? aliasPath : nameIn;
  XmpPtr xmp = W(mRef);
  if (!detail::NamespaceKnown(ns)) return;
  char missing = 0;
  CheckAncestors(xmp, ns, name, &missing);
  if (missing) return;
  if (!xmp_delete_property(xmp, ns.c_str(), name.c_str())) Fail("deleting", ns, name);
}

bool XMPMeta::DoesPropertyExist(const std::string& nsIn, const std::string& nameIn) const {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, nameIn, true, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& name = aliased ? aliasPath : nameIn;
  XmpPtr xmp = X(mRef);
  if (!detail::NamespaceKnown(ns)) return false;
  char missing = 0;
  CheckAncestors(xmp, ns, name, &missing);
  if (missing) return false;
  if (xmp_has_property(xmp, ns.c_str(), name.c_str())) return true;
  if (xmp_get_error() != 0) Fail("testing", ns, name);
  return false;
}

// ---- typed ----

std::optional<bool> XMPMeta::GetProperty_Bool(const std::string& ns, const std::string& name) const {
  return GetConverted(*this, ns, name, [](const std::string& text) { return XMPUtils::ConvertToBool(text); });
}

std::optional<std::int32_t> XMPMeta::GetProperty_Int(const std::string& ns, const std::string& name) const {
  return GetConverted(*this, ns, name, [](const std::string& text) { return XMPUtils::ConvertToInt(text); });
}

std::optional<std::int64_t> XMPMeta::GetProperty_Int64(const std::string& ns, const std::string& name) const {
  return GetConverted(*this, ns, name, [](const std::string& text) { return XMPUtils::ConvertToInt64(text); });
}

std::optional<double> XMPMeta::GetProperty_Float(const std::string& ns, const std::string& name) const {
  return GetConverted(*this, ns, name, [](const std::string& text) { return XMPUtils::ConvertToFloat(text); });
}

void XMPMeta::SetProperty_Bool(const std::string& ns, const std::string& name, bool value,
                               XMP_OptionBits options) {
  std::string text;
  text = XMPUtils::ConvertFromBool(value);
  SetProperty(ns, name, text, options);
}

void XMPMeta::SetProperty_Int(const std::string& ns, const std::string& name, std::int32_t value,
                              XMP_OptionBits options) {
  std::string text;
  text = XMPUtils::ConvertFromInt(value);
  SetProperty(ns, name, text, options);
}

void XMPMeta::SetProperty_Int64(const std::string& ns, const std::string& name, std::int64_t value,
                                XMP_OptionBits options) {
  std::string text;
  text = XMPUtils::ConvertFromInt64(value);
  SetProperty(ns, name, text, options);
}

void XMPMeta::SetProperty_Float(const std::string& ns, const std::string& name, double value,
                                XMP_OptionBits options) {
  std::string text;
  text = XMPUtils::ConvertFromFloat(value, std::string());
  SetProperty(ns, name, text, options);
}

void XMPMeta::SetProperty_Date(const std::string& ns, const std::string& name, const XMP_DateTime& value,
                               XMP_OptionBits options) {
  std::string text;
  text = XMPUtils::ConvertFromDate(value);
  SetProperty(ns, name, text, options);
}

// ---- arrays ----

std::optional<XMP_Node> XMPMeta::GetArrayItem(const std::string& nsIn, const std::string& arrayNameIn,
                                              XMP_Index index) const {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, arrayNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& arrayName = aliased ? aliasPath : arrayNameIn;
  XmpPtr xmp = X(mRef);
  CheckIndex(index);
  bool exists = false;
  RequireArray(xmp, ns, arrayName, &exists);
  if (!exists) return std::nullopt;
  XmpString text;
  std::uint32_t bits = 0;
  if (!xmp_get_array_item(xmp, ns.c_str(), arrayName.c_str(), index, text, &bits)) {
    if (xmp_get_error() != 0) Fail("reading an item of", ns, arrayName);
    return std::nullopt;
  }
  return XMP_Node{text.str(), bits};
}

void XMPMeta::SetArrayItem(const std::string& nsIn, const std::string& arrayNameIn, XMP_Index index,
                           const std::string& value, XMP_OptionBits options) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, arrayNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& arrayName = aliased ? aliasPath : arrayNameIn;
  XmpPtr xmp = W(mRef);
  detail::RequirePrefix(ns);
  CheckIndex(index);
  bool exists = false;
  RequireArray(xmp, ns, arrayName, &exists);
  if (!exists) detail::Throw(kXMPErr_BadXPath, "array \"" + arrayName + "\" does not exist");
  const XMP_Index count = CountArrayItems(ns, arrayName);
  const XMP_Index position = index == kXMP_ArrayLastItem ? count : index;
  if (position < 1 || position > count + 1 || (position == count + 1 && (options & kXMP_InsertAfterItem)))
    detail::Throw(kXMPErr_BadIndex, "array index " + std::to_string(index));
  options = WithImpliedBits(options);
  const XMP_OptionBits composite = options & kXMP_PropCompositeMask;
  if (composite && !value.empty()) detail::Throw(kXMPErr_BadXPath, "composite array items have no value");
  // The toolkit places only simple items; a composite one is placed empty,
  // then given its form.
  if (!xmp_set_array_item(xmp, ns.c_str(), arrayName.c_str(), position, value.c_str(), options & ~composite))
    Fail("writing an item of", ns, arrayName);
  if (composite) {
    const XMP_Index placed = (options & kXMP_InsertAfterItem) ? position + 1 : position;
    const std::string item = arrayName + "[" + std::to_string(placed) + "]";
    if (!xmp_set_property(xmp, ns.c_str(), item.c_str(), "", composite | kXMP_DeleteExisting))
      Fail("writing an item of", ns, arrayName);
  }
}

void XMPMeta::AppendArrayItem(const std::string& nsIn, const std::string& arrayNameIn, XMP_OptionBits arrayOptions,
                              const std::string& value, XMP_OptionBits options) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, arrayNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& arrayName = aliased ? aliasPath : arrayNameIn;
  XmpPtr xmp = W(mRef);
  detail::RequirePrefix(ns);
  arrayOptions = WithImpliedBits(arrayOptions);
  options = WithImpliedBits(options);
  bool exists = false;
  RequireArray(xmp, ns, arrayName, &exists);
  if (!exists && !(arrayOptions & kXMP_PropArrayFormMask))
    detail::Throw(kXMPErr_BadOptions, "appending to \"" + arrayName + "\" needs an array form");
  if (options & kXMP_PropCompositeMask) {
    // The toolkit's append insists on a string value; composite items are
    // created through their item path instead.
    if (!value.empty()) detail::Throw(kXMPErr_BadXPath, "composite array items have no value");
    if (!exists && !xmp_set_property(xmp, ns.c_str(), arrayName.c_str(), "", arrayOptions & kXMP_PropArrayFormMask))
      Fail("creating", ns, arrayName);
    const std::string item = arrayName + "[" + std::to_string(CountArrayItems(ns, arrayName) + 1) + "]";
    if (!xmp_set_property(xmp, ns.c_str(), item.c_str(), "", options & kXMP_PropCompositeMask))
      Fail("appending to", ns, arrayName);
    return;
  }
  if (!xmp_append_array_item(xmp, ns.c_str(), arrayName.c_str(), exists ? 0 : arrayOptions, value.c_str(),
                             options))
    Fail("appending to", ns, arrayName);
}

void XMPMeta::DeleteArrayItem(const std::string& nsIn, const std::string& arrayNameIn, XMP_Index index) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, arrayNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& arrayName = aliased ? aliasPath : arrayNameIn;
  std::string path;
  path = XMPUtils::ComposeArrayItemPath(ns, arrayName, index);
  bool exists = false;
  RequireArray(X(mRef), ns, arrayName, &exists);
  if (exists) DeleteProperty(ns, path);
}

XMP_Index XMPMeta::CountArrayItems(const std::string& nsIn, const std::string& arrayNameIn) const {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, arrayNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& arrayName = aliased ? aliasPath : arrayNameIn;
  XmpPtr xmp = X(mRef);
  bool exists = false;
  RequireArray(xmp, ns, arrayName, &exists);
  if (!exists) return 0;
  // Probe the item paths: doubling, then bisection.
  const std::string base = arrayName + "[";
  const auto has = [&](XMP_Index i) {
    const std::string path = base + std::to_string(i) + "]";
    return xmp_has_property(xmp, ns.c_str(), path.c_str());
  };
  if (!has(1)) return 0;
  XMP_Index low = 1, high = 2;
  while (has(high)) {
    low = high;
    high *= 2;
  }
  while (high - low > 1) {
    const XMP_Index mid = low + (high - low) / 2;
    (has(mid) ? low : high) = mid;
  }
  return low;
}

// ---- struct fields and qualifiers ----

std::optional<XMP_Node> XMPMeta::GetStructField(const std::string& ns, const std::string& structName,
                                                const std::string& fieldNS, const std::string& fieldName) const {
  const std::string path = XMPUtils::ComposeStructFieldPath(ns, structName, fieldNS, fieldName);
  XMP_OptionBits parent = 0;
  if (!NodeOptions(X(mRef), ns, structName, &parent)) return std::nullopt;
  if (!(parent & kXMP_PropValueIsStruct)) detail::Throw(kXMPErr_BadXPath, "\"" + structName + "\" is not a structure");
  return GetProperty(ns, path);
}

void XMPMeta::SetStructField(const std::string& ns, const std::string& structName, const std::string& fieldNS,
                             const std::string& fieldName, const std::string& value, XMP_OptionBits options) {
  std::string path;
  path = XMPUtils::ComposeStructFieldPath(ns, structName, fieldNS, fieldName);
  XMP_OptionBits parent = 0;
  if (NodeOptions(X(mRef), ns, structName, &parent) && !(parent & kXMP_PropValueIsStruct))
    detail::Throw(kXMPErr_BadXPath, "\"" + structName + "\" is not a structure");
  SetProperty(ns, path, value, options);
}

// ---- localised text ----

std::optional<XMP_LocalizedNode> XMPMeta::GetLocalizedText(const std::string& nsIn, const std::string& altTextNameIn,
                                                           const std::string& genericLang,
                                                           const std::string& specificLang) const {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, altTextNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& altTextName = aliased ? aliasPath : altTextNameIn;
  XmpPtr xmp = X(mRef);
  if (specificLang.empty()) detail::Throw(kXMPErr_BadParam, "empty specific language");
  XMP_OptionBits form = 0;
  if (!NodeOptions(xmp, ns, altTextName, &form)) return std::nullopt;
  if (!(form & kXMP_PropArrayIsAlternate) && !(form & kXMP_PropArrayIsAltText))
    detail::Throw(kXMPErr_BadXPath, "\"" + altTextName + "\" is not a language alternative");
  XmpString lang, text;
  std::uint32_t bits = 0;
  if (!xmp_get_localized_text(xmp, ns.c_str(), altTextName.c_str(), genericLang.c_str(), specificLang.c_str(),
                              lang, text, &bits)) {
    if (xmp_get_error() != 0) Fail("reading localised", ns, altTextName);
    return std::nullopt;
  }
  return XMP_LocalizedNode{lang.str(), text.str(), bits};
}

void XMPMeta::SetLocalizedText(const std::string& nsIn, const std::string& altTextNameIn,
                               const std::string& genericLang, const std::string& specificLang,
                               const std::string& itemValue, XMP_OptionBits options) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, altTextNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& altTextName = aliased ? aliasPath : altTextNameIn;
  XmpPtr xmp = W(mRef);
  detail::RequirePrefix(ns);
  if (specificLang.empty()) detail::Throw(kXMPErr_BadParam, "empty specific language");
  XMP_OptionBits form = 0;
  if (NodeOptions(xmp, ns, altTextName, &form) && !(form & kXMP_PropArrayIsAlternate))
    detail::Throw(kXMPErr_BadXPath, "\"" + altTextName + "\" is not a language alternative");
  if (!xmp_set_localized_text(xmp, ns.c_str(), altTextName.c_str(), genericLang.c_str(), specificLang.c_str(),
                              itemValue.c_str(), options))
    Fail("writing localised", ns, altTextName);
}

void XMPMeta::DeleteLocalizedText(const std::string& nsIn, const std::string& altTextNameIn,
                                  const std::string& genericLang, const std::string& specificLang) {
  std::string aliasNS, aliasPath;
  const bool aliased = ResolveArrayAlias(nsIn, altTextNameIn, false, &aliasNS, &aliasPath);
  const std::string& ns = aliased ? aliasNS : nsIn;
  const std::string& altTextName = aliased ? aliasPath : altTextNameIn;
  XmpPtr xmp = W(mRef);
  XMP_OptionBits form = 0;
  if (!NodeOptions(xmp, ns, altTextName, &form) || !(form & kXMP_PropArrayIsAlternate)) return;
  if (!GetLocalizedText(ns, altTextName, genericLang, specificLang)) return;
  if (!xmp_delete_localized_text(xmp, ns.c_str(), altTextName.c_str(), genericLang.c_str(), specificLang.c_str()))
    Fail("deleting localised", ns, altTextName);
}

}  // namespace ovraxmp
