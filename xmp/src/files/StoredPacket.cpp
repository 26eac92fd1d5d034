// The stored XMP edited property by property (see StoredPacket.h).
#include "StoredPacket.h"

#include <algorithm>
#include <cstdio>

#include <ovraxmp/XMPUtils.h>

#include "../XMPPacket.h"
#include "Container.h"

namespace ovraxmp {
namespace detail {
namespace {

const char kNS_XMPNote[] = "http://ns.adobe.com/xmp/note/";
const Key kExtensionDigest{kNS_XMPNote, "xmpNote:HasExtendedXMP"};

bool Same(const Key& a, const Key& b) { return a.ns == b.ns && a.name == b.name; }
bool Contains(const std::vector<Key>& keys, const Key& key) {
  return std::any_of(keys.begin(), keys.end(), [&](const Key& k) { return Same(k, key); });
}

std::string LocalName(const std::string& name) {
  const std::size_t colon = name.find(':');
  return colon == std::string::npos ? name : name.substr(colon + 1);
}

std::optional<std::string> CanonicalOf(const XMPMeta& meta, const Key& key) {
  Node node;
  if (!ReadNode(meta, key.ns, key.name, &node)) return std::nullopt;
  return Canonical(node);
}

void CopyProperty(const XMPMeta& from, XMPMeta& to, const Key& key) {
  Node node;
  if (ReadNode(from, key.ns, key.name, &node)) {
    WriteNode(to, key.ns, key.name, node);
  } else {
    to.DeleteProperty(key.ns, key.name);
  }
}

// One property as RDF/XML, written by the toolkit's serialiser.
Fragment FragmentOf(const XMPMeta& source, const Key& key) {
  XMPMeta single;
  CopyProperty(source, single, key);
  std::string text;
  single.SerializeToBuffer(&text, kXMP_OmitPacketWrapper);
  const std::size_t description = text.find("<rdf:Description");
  const std::size_t open = text.find('>', description);
  const std::size_t close = text.rfind("</rdf:Description>");
  if (description == std::string::npos || open == std::string::npos || close == std::string::npos || close < open)
    throw XMP_Error(kXMPErr_BadSerialize, "cannot write \"" + key.name + "\"");
  Fragment fragment;
  const std::string tag = text.substr(description, open - description);
  for (std::size_t at = 0; (at = tag.find("xmlns:", at)) != std::string::npos;) {
    const std::size_t equals = tag.find('=', at);
    const char quote = tag[equals + 1];
    const std::size_t end = tag.find(quote, equals + 2);
    fragment.namespaces.emplace_back(tag.substr(at + 6, equals - at - 6), tag.substr(equals + 2, end - equals - 2));
    at = end;
  }
  fragment.namespaces.emplace_back("rdf", kXMP_NS_RDF);
  fragment.text = text.substr(open + 1, close - open - 1);
  const std::size_t first = fragment.text.find('<');
  const std::size_t lineStart = fragment.text.rfind('\n', first);
  fragment.text.erase(0, lineStart == std::string::npos ? 0 : lineStart + 1);
  fragment.text.erase(fragment.text.find_last_not_of(" \t\r\n") + 1);
  return fragment;
}

// The fragment alone in a packet, as the toolkit reads it.
XMPMeta ParseAlone(const Fragment& fragment) {
  std::string packet = "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"" + std::string(kXMP_NS_RDF) +
                       "\"><rdf:Description rdf:about=\"\"";
  for (const auto& ns : fragment.namespaces) {
    if (ns.first != "rdf") packet += " xmlns:" + ns.first + "=\"" + ns.second + "\"";
  }
  packet += ">" + fragment.text + "</rdf:Description></rdf:RDF></x:xmpmeta>";
  XMPMeta single;
  single.ParseFromBuffer(packet);
  return single;
}

}  // namespace

std::vector<Key> Properties(const XMPMeta& meta) {
  std::vector<Key> keys = TopLevelProperties(meta);
  keys.erase(std::remove_if(keys.begin(), keys.end(), [](const Key& k) { return k.ns == kXMP_NS_Transient; }),
             keys.end());
  return keys;
}

std::vector<Key> Differences(const XMPMeta& before, const XMPMeta& after) {
  std::vector<Key> keys = Properties(before);
  for (const Key& key : Properties(after))
    if (!Contains(keys, key)) keys.push_back(key);
  std::vector<Key> changed;
  for (const Key& key : keys)
    if (CanonicalOf(before, key) != CanonicalOf(after, key)) changed.push_back(key);
  return changed;
}

XMPMeta OwnPacket(XmpPtr xmp) {
  XMPPacket* packet = NewPacket(xmp);
  XMPMeta meta(packet);
  XMPMetaRefRelease(packet);
  return meta;
}

StoredPacket::StoredPacket(std::optional<std::string> packet, std::optional<std::string> extension)
    : mPacket(std::move(packet)), mExtension(std::move(extension)) {}

XMPMeta StoredPacket::Parsed() const {
  XMPMeta meta;
  if (mPacket) meta.ParseFromBuffer(*mPacket);
  if (mExtension) {
    XMPMeta extension;
    extension.ParseFromBuffer(*mExtension);
    for (const Key& key : Properties(extension)) CopyProperty(extension, meta, key);
  }
  return meta;
}

bool StoredPacket::InExtension(const Key& key) const { return Contains(mExtensionKeys, key); }

void StoredPacket::Apply(const XMPMeta& source, const std::vector<Key>& changed, std::optional<std::size_t> limit) {
  mChanged = changed;
  XMPMeta stored;
  try {
    stored = Parsed();
  } catch (const XMP_Error& e) {
    throw XMP_Error(kXMPErr_BadXMP,
                    std::string("its XMP packet cannot be read, so it is left as it is (") + e.GetErrMsg() + ")");
  }
  XMPMeta expected = stored.Clone();
  for (const Key& key : changed) CopyProperty(source, expected, key);
  if (mExtension) {
    XMPMeta extension;
    extension.ParseFromBuffer(*mExtension);
    mExtensionKeys = Properties(extension);
  }
  if (mPacket) {
    auto editor = std::make_unique<PacketEditor>();
    std::string problem;
    if (editor->Load(*mPacket, &problem) && editor->Editable()) {
      for (const Key& key : changed) {
        if (InExtension(key)) continue;
        if (source.DoesPropertyExist(key.ns, key.name)) {
          mFragments.emplace_back(key, FragmentOf(source, key));
          editor->Put(key.ns, LocalName(key.name), mFragments.back().second);
        } else {
          editor->Remove(key.ns, LocalName(key.name));
        }
      }
      mEditor = std::move(editor);
    }
  }
  mExpected = std::move(expected);
  if (!mEditor) {
    // No stored packet, or one written in a form edits cannot follow: the
    // packet is written whole, without what an extension holds.
    XMPMeta whole = mExpected->Clone();
    for (const Key& key : mExtensionKeys) whole.DeleteProperty(key.ns, key.name);
    std::string text;
    whole.SerializeToBuffer(&text, 0, 0);
    mWhole = std::move(text);
    if (limit && mWhole->size() > *limit)
      throw XMP_Error(kXMPErr_TooLargeForJPEG, "the XMP packet would be larger than the file's format holds");
  } else if (limit) {
    Fit(stored, *limit);
  }
}

// Moves the largest properties of the packet to the extension until the
// packet fits, and writes the extension anew when it changed.
void StoredPacket::Fit(const XMPMeta& stored, std::size_t limit) {
  bool extensionChanged = std::any_of(mChanged.begin(), mChanged.end(), [&](const Key& k) { return InExtension(k); });
  const auto fits = [&] {
    const std::optional<std::string> packet = mEditor->Render(std::nullopt, 0);
    return packet && packet->size() + 128 <= limit;  // room for the extension's digest
  };
  if (!fits()) mGrowthPadding = 0;
  // The properties the packet will hold, largest first: stored ones by the
  // bytes they take, new or changed ones by their fragments.
  std::vector<std::pair<Key, std::size_t>> sizes;
  const std::vector<Key> all = Properties(*mExpected);
  for (const auto& [ns, local, size] : mEditor->PropertySizes()) {
    const auto key = std::find_if(all.begin(), all.end(),
                                  [&, &ns = ns, &local = local](const Key& k) { return k.ns == ns && LocalName(k.name) == local; });
    if (key != all.end()) sizes.emplace_back(*key, size);
  }
  for (const auto& [key, fragment] : mFragments) sizes.emplace_back(key, fragment.text.size());
  std::stable_sort(sizes.begin(), sizes.end(), [](const auto& a, const auto& b) { return a.second > b.second; });
  for (const auto& [key, size] : sizes) {
    if (fits()) break;
    if (Same(key, kExtensionDigest) || InExtension(key) || !mExpected->DoesPropertyExist(key.ns, key.name)) continue;
    mEditor->Remove(key.ns, LocalName(key.name));
    mFragments.erase(std::remove_if(mFragments.begin(), mFragments.end(),
                                    [&, &key = key](const auto& f) { return Same(f.first, key); }),
                     mFragments.end());
    mExtensionKeys.push_back(key);
    extensionChanged = true;
  }
  if (!fits()) throw XMP_Error(kXMPErr_TooLargeForJPEG, "the XMP does not fit in the file, even split in two");
  if (!extensionChanged) return;
  XMPMeta extension;
  for (const Key& key : mExtensionKeys) CopyProperty(*mExpected, extension, key);
  std::string text;
  if (!Properties(extension).empty()) {
    extension.SerializeToBuffer(&text, kXMP_OmitPacketWrapper | kXMP_UseCompactFormat, 0);
    // The packet names the toolkit that wrote it; readers that join the two
    // parts would take the extension's name for the packet's.
    const std::size_t toolkit = text.find(" x:xmptk=\"");
    if (toolkit != std::string::npos) text.erase(toolkit, text.find('"', toolkit + 10) + 1 - toolkit);
  }
  mNewExtension = text;
  // The packet names its extension by the extension's digest.
  XMPMeta note;
  if (!text.empty()) note.SetProperty(kNS_XMPNote, "HasExtendedXMP", ExtensionDigest(text));
  if (!text.empty() || stored.DoesPropertyExist(kNS_XMPNote, "HasExtendedXMP")) {
    if (text.empty()) {
      mEditor->Remove(kNS_XMPNote, "HasExtendedXMP");
    } else {
      mFragments.emplace_back(kExtensionDigest, FragmentOf(note, kExtensionDigest));
      mEditor->Put(kNS_XMPNote, "HasExtendedXMP", mFragments.back().second);
    }
    CopyProperty(note, *mExpected, kExtensionDigest);
  }
}

std::optional<std::string> StoredPacket::Render(std::optional<std::size_t> length) const {
  if (!mEditor) return length ? std::nullopt : mWhole;
  return mEditor->Render(length, mGrowthPadding);
}

std::vector<std::string> StoredPacket::Candidates() const {
  std::vector<std::string> candidates;
  if (mPacket) {
    if (auto same = mEditor ? Render(mPacket->size()) : std::nullopt) candidates.push_back(std::move(*same));
    if (!mEditor) {
      std::string same;
      try {
        XMPMeta whole;
        whole.ParseFromBuffer(*mWhole);
        whole.SerializeToBuffer(&same, kXMP_ExactPacketLength, static_cast<std::uint32_t>(mPacket->size()));
        candidates.push_back(std::move(same));
      } catch (const XMP_Error&) {
        // Too long for the old place: the grown packet below.
      }
    }
  }
  if (auto grown = Render(std::nullopt)) candidates.push_back(std::move(*grown));
  if (candidates.empty()) throw XMP_Error(kXMPErr_InternalFailure, "the XMP packet could not be edited");
  const std::vector<std::string> wrong = Misread(candidates.back());
  if (!wrong.empty()) {
    std::string names;
    for (const std::string& name : wrong) names += (names.empty() ? "" : ", ") + name;
    throw XMP_Error(kXMPErr_InternalFailure,
                    "the edited XMP did not read back as written (" + names + "), so the file is left as it is");
  }
  return candidates;
}

// The properties the written XMP would not read back as intended. Written
// whole, it must read back as expected. Edited, it is checked in parts,
// since the toolkit's reader normalises some packets as a whole (an
// rdf:about "uuid:..." also reads as xmpMM:InstanceID): every property left
// alone reads back as it read before, and every fragment put in reads, on
// its own, as the property it stands for.
std::vector<std::string> StoredPacket::Misread(const std::string& packet) const {
  StoredPacket written(packet, mNewExtension ? (mNewExtension->empty() ? std::nullopt : mNewExtension) : mExtension);
  const XMPMeta check = written.Parsed();
  std::vector<std::string> wrong;
  if (!mEditor) {
    for (const Key& key : Differences(check, *mExpected)) wrong.push_back(key.name);
    return wrong;
  }
  std::vector<Key> changed = mChanged;
  changed.push_back(kExtensionDigest);
  for (const Key& key : Differences(Parsed(), check))
    if (!Contains(changed, key)) wrong.push_back(key.name);
  for (const Key& key : changed) {
    if (check.DoesPropertyExist(key.ns, key.name) != mExpected->DoesPropertyExist(key.ns, key.name))
      wrong.push_back(key.name);
  }
  for (const auto& [key, fragment] : mFragments) {
    if (CanonicalOf(ParseAlone(fragment), key) != CanonicalOf(*mExpected, key)) wrong.push_back(key.name);
  }
  for (const Key& key : mExtensionKeys) {
    if (Contains(mChanged, key) && CanonicalOf(check, key) != CanonicalOf(*mExpected, key)) wrong.push_back(key.name);
  }
  return wrong;
}

}  // namespace detail
}  // namespace ovraxmp
