// The stored XMP edited property by property (see StoredPacket.h).
#include "StoredPacket.h"

#include <algorithm>
#include <map>


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

using TextMap = std::map<std::pair<std::string, std::string>, std::string>;

// The properties of a packet by key, from one walk; the transient
// namespace is left out.
TextMap TextsOf(const XMPMeta& meta) {
  TextMap texts;
  for (const PropertyText& p : CachedTexts(meta))
    if (p.key.ns != kXMP_NS_Transient) texts[{p.key.ns, p.key.name}] = p.text;
  return texts;
}

const std::string* Find(const TextMap& texts, const Key& key) {
  const auto found = texts.find({key.ns, key.name});
  return found == texts.end() ? nullptr : &found->second;
}

void CopyProperty(const XMPMeta& from, XMPMeta& to, const Key& key) {
  Node node;
  if (ReadNode(from, key.ns, key.name, &node)) {
    WriteNode(to, key.ns, key.name, node);
  } else {
    to.DeleteProperty(key.ns, key.name);
  }
}

XMPMeta ParsedText(const std::string& text) {
  XMPMeta meta;
  ParseUnchecked(meta, text);
  return meta;
}

// The properties as RDF/XML, written by the toolkit's serialiser in one
// packet and cut apart.
std::vector<std::pair<Key, Fragment>> FragmentsOf(const XMPMeta& source, const std::vector<Key>& keys) {
  std::vector<std::pair<Key, Fragment>> fragments;
  if (keys.empty()) return fragments;
  XMPMeta all;
  for (const Key& key : keys) CopyProperty(source, all, key);
  const std::string text = all.SerializeToBuffer(kXMP_OmitPacketWrapper);
  PacketLayout layout;
  if (!ScanPacket(text, nullptr, &layout) || layout.descriptions.empty())
    throw XMP_Error(kXMPErr_BadSerialize, "cannot write the changed properties");
  std::vector<std::pair<std::string, std::string>> namespaces(layout.descriptions[0].scope.begin(),
                                                             layout.descriptions[0].scope.end());
  for (const Key& key : keys) {
    for (const PacketLayout::Property& p : layout.properties) {
      if (p.ns != key.ns || p.name != LocalName(key.name)) continue;
      const std::size_t lineStart = text.rfind('\n', p.begin);
      const std::size_t from = lineStart == std::string::npos ? p.begin : lineStart + 1;
      fragments.push_back({key, {text.substr(from, p.end - from), namespaces}});
      break;
    }
  }
  return fragments;
}

// The fragments together in one packet, as the toolkit reads them.
TextMap ReadAlone(const std::vector<std::pair<Key, Fragment>>& fragments) {
  if (fragments.empty()) return TextMap();
  std::string packet = "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"" + std::string(kXMP_NS_RDF) +
                       "\"><rdf:Description rdf:about=\"\"";
  std::map<std::string, std::string> declared;
  for (const auto& entry : fragments)
    for (const auto& ns : entry.second.namespaces) declared.insert(ns);
  for (const auto& ns : declared)
    if (ns.first != "rdf" && !ns.first.empty()) packet += " xmlns:" + ns.first + "=\"" + ns.second + "\"";
  packet += ">";
  for (const auto& entry : fragments) packet += entry.second.text + "\n";
  packet += "</rdf:Description></rdf:RDF></x:xmpmeta>";
  return TextsOf(ParsedText(packet));
}

}  // namespace

std::vector<Key> Properties(const XMPMeta& meta) {
  std::vector<Key> keys = TopLevelProperties(meta);
  keys.erase(std::remove_if(keys.begin(), keys.end(), [](const Key& k) { return k.ns == kXMP_NS_Transient; }),
             keys.end());
  return keys;
}

std::vector<Key> Differences(const std::vector<PropertyText>& was, const std::vector<PropertyText>& is) {
  TextMap now;
  for (const PropertyText& p : is) now[{p.key.ns, p.key.name}] = p.text;
  std::vector<Key> changed;
  for (const PropertyText& p : was) {
    const auto found = now.find({p.key.ns, p.key.name});
    if (found == now.end() || found->second != p.text) changed.push_back(p.key);
    if (found != now.end()) now.erase(found);
  }
  for (const PropertyText& p : is)
    if (now.count({p.key.ns, p.key.name})) changed.push_back(p.key);
  changed.erase(std::remove_if(changed.begin(), changed.end(), [](const Key& k) { return k.ns == kXMP_NS_Transient; }),
                changed.end());
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

const XMPMeta& StoredPacket::Stored() const {
  if (!mStored) {
    XMPMeta meta;
    if (mPacket) meta.ParseFromBuffer(*mPacket);
    if (mExtension) {
      XMPMeta extension;
      extension.ParseFromBuffer(*mExtension);
      for (const Key& key : Properties(extension)) CopyProperty(extension, meta, key);
    }
    mStored = std::move(meta);
  }
  return *mStored;
}

XMPMeta StoredPacket::TakeStored() {
  Stored();
  XMPMeta meta = std::move(*mStored);
  mStored.reset();
  return meta;
}

bool StoredPacket::InExtension(const Key& key) const { return Contains(mExtensionKeys, key); }

void StoredPacket::Apply(const XMPMeta& source, const std::vector<PropertyText>& texts, const std::vector<Key>& changed,
                         std::optional<std::size_t> limit) {
  mChanged = changed;
  const XMPMeta* stored = nullptr;
  try {
    stored = &Stored();
  } catch (const XMP_Error& e) {
    throw XMP_Error(kXMPErr_BadXMP,
                    std::string("its XMP packet cannot be read, so it is left as it is (") + e.GetErrMsg() + ")");
  }
  // What each changed property must read as; absent when it goes.
  for (const PropertyText& p : texts)
    if (Contains(changed, p.key)) mIntended[{p.key.ns, p.key.name}] = p.text;
  if (mExtension) mExtensionKeys = Properties(ParsedText(*mExtension));

  if (mPacket) {
    auto editor = std::make_unique<PacketEditor>();
    if (editor->Load(*mPacket, nullptr) && editor->Editable()) {
      std::vector<Key> put;
      for (const Key& key : changed) {
        if (InExtension(key)) continue;
        if (Find(mIntended, key)) {
          put.push_back(key);
        } else {
          editor->Remove(key.ns, LocalName(key.name));
        }
      }
      mFragments = FragmentsOf(source, put);
      for (const auto& [key, fragment] : mFragments) editor->Put(key.ns, LocalName(key.name), fragment);
      mEditor = std::move(editor);
    }
  }
  if (!mEditor) {
    // No stored packet, or one written in a form edits cannot follow: the
    // packet is written whole, without what an extension holds.
    XMPMeta whole = mPacket ? ParsedText(*mPacket) : XMPMeta();
    for (const Key& key : changed)
      if (!InExtension(key)) CopyProperty(source, whole, key);
    mWhole = whole.SerializeToBuffer();
    if (limit && mWhole->size() > *limit)
      throw XMP_Error(kXMPErr_TooLargeForJPEG, "the XMP packet would be larger than the file's format holds");
  } else if (limit) {
    Fit(source, *stored, *limit);
  }
  if (!mEditor || !limit) {
    // A changed property the extension holds is written there; the packet
    // must then name the new extension.
    if (std::any_of(changed.begin(), changed.end(), [&](const Key& k) { return InExtension(k); })) {
      if (!mEditor) throw XMP_Error(kXMPErr_Unimplemented, "its Extended XMP is not written with a packet of this form");
      WriteExtension(source, *stored);
    }
  }
}

// Moves the largest properties of the packet to the extension until the
// packet fits, and writes the extension anew when it changed.
void StoredPacket::Fit(const XMPMeta& source, const XMPMeta& stored, std::size_t limit) {
  bool extensionChanged = std::any_of(mChanged.begin(), mChanged.end(), [&](const Key& k) { return InExtension(k); });
  const auto fits = [&] {
    const std::optional<std::string> packet = mEditor->Render(std::nullopt, 0);
    return packet && packet->size() + 128 <= limit;  // room for the extension's digest
  };
  if (!fits()) {
    mGrowthPadding = 0;
    // The properties the packet will hold, largest first: stored ones by
    // the bytes they take, new or changed ones by their fragments.
    std::vector<std::pair<Key, std::size_t>> sizes;
    const std::vector<Key> all = Properties(stored);
    for (const auto& [ns, local, size] : mEditor->PropertySizes()) {
      const auto key = std::find_if(all.begin(), all.end(), [&, &ns = ns, &local = local](const Key& k) {
        return k.ns == ns && LocalName(k.name) == local;
      });
      if (key != all.end() && !Contains(mChanged, *key)) sizes.emplace_back(*key, size);
    }
    for (const auto& [key, fragment] : mFragments) sizes.emplace_back(key, fragment.text.size());
    std::stable_sort(sizes.begin(), sizes.end(), [](const auto& a, const auto& b) { return a.second > b.second; });
    for (const auto& [key, size] : sizes) {
      if (fits()) break;
      if (Same(key, kExtensionDigest) || InExtension(key)) continue;
      mEditor->Remove(key.ns, LocalName(key.name));
      mFragments.erase(std::remove_if(mFragments.begin(), mFragments.end(),
                                      [&, &key = key](const auto& f) { return Same(f.first, key); }),
                       mFragments.end());
      mExtensionKeys.push_back(key);
      extensionChanged = true;
    }
    if (!fits()) throw XMP_Error(kXMPErr_TooLargeForJPEG, "the XMP does not fit in the file, even split in two");
  }
  if (extensionChanged) WriteExtension(source, stored);
}

// The extension anew, from its properties as they are now; the packet
// names it by its digest.
void StoredPacket::WriteExtension(const XMPMeta& source, const XMPMeta& stored) {
  XMPMeta extension;
  for (const Key& key : mExtensionKeys) CopyProperty(Contains(mChanged, key) ? source : stored, extension, key);
  std::string text;
  if (!Properties(extension).empty()) {
    text = extension.SerializeToBuffer(kXMP_OmitPacketWrapper | kXMP_UseCompactFormat, 0);
    // The packet names the toolkit that wrote it; readers that join the two
    // parts would take the extension's name for the packet's.
    const std::size_t toolkit = text.find(" x:xmptk=\"");
    if (toolkit != std::string::npos) text.erase(toolkit, text.find('"', toolkit + 10) + 1 - toolkit);
  }
  mNewExtension = text;
  if (!mEditor) return;
  if (text.empty()) {
    mEditor->Remove(kNS_XMPNote, "HasExtendedXMP");
    return;
  }
  XMPMeta note;
  note.SetProperty(kNS_XMPNote, "HasExtendedXMP", ExtensionDigest(text));
  mFragments.erase(std::remove_if(mFragments.begin(), mFragments.end(),
                                  [&](const auto& f) { return Same(f.first, kExtensionDigest); }),
                   mFragments.end());
  for (auto& entry : FragmentsOf(note, {kExtensionDigest})) {
    mEditor->Put(kNS_XMPNote, "HasExtendedXMP", entry.second);
    mIntended[{kExtensionDigest.ns, kExtensionDigest.name}] = TextsOf(note).begin()->second;
    mFragments.push_back(std::move(entry));
  }
}

std::optional<std::string> StoredPacket::Render(std::optional<std::size_t> length) const {
  if (!mEditor) return length ? std::nullopt : mWhole;
  return mEditor->Render(length, mGrowthPadding);
}

std::vector<std::string> StoredPacket::Candidates() const {
  std::vector<std::string> candidates;
  if (mPacket) {
    if (mEditor) {
      if (auto same = Render(mPacket->size())) candidates.push_back(std::move(*same));
    } else {
      try {
        candidates.push_back(
            ParsedText(*mWhole).SerializeToBuffer(kXMP_ExactPacketLength, static_cast<std::uint32_t>(mPacket->size())));
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

// The properties the written XMP would not read back as intended: every
// property left alone must read back as it read before, and every changed
// one as intended. A fragment put in is checked on its own, since the
// toolkit's reader normalises some packets as a whole (an rdf:about
// "uuid:..." also reads as xmpMM:InstanceID).
std::vector<std::string> StoredPacket::Misread(const std::string& packet) const {
  XMPMeta check = ParsedText(packet);
  const std::optional<std::string>& extension = mNewExtension ? mNewExtension : mExtension;
  if (extension && !extension->empty()) {
    const XMPMeta parts = ParsedText(*extension);
    for (const Key& key : Properties(parts)) CopyProperty(parts, check, key);
  }
  const TextMap before = TextsOf(Stored()), after = TextsOf(check), alone = ReadAlone(mFragments);
  std::vector<Key> changed = mChanged;
  if (mNewExtension) changed.push_back(kExtensionDigest);
  std::vector<std::string> wrong;
  std::map<std::pair<std::string, std::string>, bool> keys;
  for (const auto& entry : before) keys[entry.first];
  for (const auto& entry : after) keys[entry.first];
  for (const auto& entry : keys) {
    const Key key{entry.first.first, entry.first.second};
    const std::string *was = Find(before, key), *is = Find(after, key), *meant = Find(mIntended, key);
    if (!Contains(changed, key)) {
      if ((was == nullptr) != (is == nullptr) || (was && *was != *is)) wrong.push_back(key.name);
    } else if ((meant == nullptr) != (is == nullptr) || (!mEditor && is && *is != *meant)) {
      wrong.push_back(key.name);
    }
  }
  for (const auto& [key, fragment] : mFragments) {
    const std::string *got = Find(alone, key), *meant = Find(mIntended, key);
    if (!got || !meant || *got != *meant) wrong.push_back(key.name);
  }
  for (const Key& key : mExtensionKeys) {
    const std::string *is = Find(after, key), *meant = Find(mIntended, key);
    if (Contains(mChanged, key) && (is == nullptr) != (meant == nullptr)) wrong.push_back(key.name);
    if (Contains(mChanged, key) && is && meant && *is != *meant) wrong.push_back(key.name);
  }
  return wrong;
}

}  // namespace detail
}  // namespace ovraxmp
