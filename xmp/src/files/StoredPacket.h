// Not part of the interface: the XMP a file stores, edited property by
// property. What a file shows is what it stores plus native values (see
// XMPFiles); what is written back is only what changed, applied onto what
// the file stores at that moment.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include <ovraxmp/XMPMeta.h>

#include "../XMPNodeTree.h"
#include "../XMPPacket.h"
#include "PacketEditor.h"

namespace ovraxmp {
namespace detail {

// Top-level properties: namespace URI and "prefix:name".
using Key = TopLevel;

// Every top-level property but those of the transient namespace.
std::vector<Key> Properties(const XMPMeta& meta);
// The top-level properties that differ between two packets.
std::vector<Key> Differences(const std::vector<PropertyText>& before, const std::vector<PropertyText>& after);
// A holder of a fresh toolkit object whose only reference it keeps.
XMPMeta OwnPacket(XmpPtr xmp);

class StoredPacket {
 public:
  // The stored packet (none: the file has none) and its continuation where
  // the format keeps large packets in two parts (JPEG's Extended XMP).
  StoredPacket(std::optional<std::string> packet, std::optional<std::string> extension);
  bool Exists() const { return mPacket.has_value(); }
  // The stored XMP as readers take it: the extension's properties over the
  // packet's, parsed once. Throws XMP_Error when it does not parse or is
  // refused. TakeStored hands it over (a later Stored parses again).
  const XMPMeta& Stored() const;
  XMPMeta TakeStored();

  // Puts the changed properties of source in: each one source holds
  // replaces the stored one, each it lacks is removed. Above limit (the
  // largest packet one place of the format holds) the largest properties
  // move to the extension. Throws XMP_Error when the stored XMP cannot be
  // read or the result does not fit.
  // texts: source's PropertyTexts.
  void Apply(const XMPMeta& source, const std::vector<PropertyText>& texts, const std::vector<Key>& changed,
             std::optional<std::size_t> limit);
  // The packets to write, to try in this order: at the stored packet's
  // length, then grown. Each reads back as intended; throws XMP_Error when
  // none would.
  std::vector<std::string> Candidates() const;
  // The extension to write with them: none when it stays as it is, empty
  // when the file's is removed.
  const std::optional<std::string>& NewExtension() const { return mNewExtension; }

 private:
  std::vector<std::string> Misread(const std::string& packet) const;
  std::optional<std::string> Render(std::optional<std::size_t> length) const;
  void Fit(const XMPMeta& source, const XMPMeta& stored, std::size_t limit);
  void WriteExtension(const XMPMeta& source, const XMPMeta& stored);
  bool InExtension(const Key& key) const;

  std::optional<std::string> mPacket, mExtension;
  mutable std::optional<XMPMeta> mStored;
  std::vector<Key> mExtensionKeys;  // kept in the extension, moved there included
  std::vector<Key> mChanged;
  // What each changed property must read as (by namespace and name); a
  // property that goes has no entry.
  std::map<std::pair<std::string, std::string>, std::string> mIntended;
  std::unique_ptr<PacketEditor> mEditor;              // the stored packet edited
  std::optional<std::string> mWhole;                  // or a packet written whole
  std::vector<std::pair<Key, Fragment>> mFragments;   // what the editor puts in
  std::optional<std::string> mNewExtension;
  std::size_t mGrowthPadding = 2048;
};

}  // namespace detail
}  // namespace ovraxmp
