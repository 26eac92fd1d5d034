// Not part of the interface: a stored XMP packet edited property by
// property. Every byte that belongs to another property, to the packet's
// wrapper, to its namespace declarations or its formatting stays as it
// was, so values the toolkit would normalise on a round trip (aliases,
// rdf:about, unknown forms) survive a write.
#pragma once

#include <optional>
#include <tuple>
#include <string>
#include <utility>
#include <vector>

#include "PacketScan.h"

namespace ovraxmp {
namespace detail {

// One top-level property written as RDF/XML: an element whose prefixes are
// bound by namespaces (prefix, URI).
struct Fragment {
  std::string text;
  std::vector<std::pair<std::string, std::string>> namespaces;
};

class PacketEditor {
 public:
  // Takes the stored packet; false, with the reason, when the checks of
  // ScanPacket refuse it.
  bool Load(std::string text, std::string* problem);
  // False when the packet is written in a form edits cannot follow.
  bool Editable() const { return mLayout.editable; }
  bool Has(const std::string& ns, const std::string& name) const;

  // Replaces the property (every occurrence) with fragment, or adds it;
  // a later Put or Remove of the same property takes the earlier one back.
  void Put(const std::string& ns, const std::string& name, Fragment fragment);
  void Remove(const std::string& ns, const std::string& name);

  // The edited packet. With length, exactly that many bytes (the padding
  // before the packet's end marker absorbs the difference), or nothing when
  // the edits do not fit; without, the padding becomes growthPadding bytes
  // when the packet has a wrapper.
  std::optional<std::string> Render(std::optional<std::size_t> length, std::size_t growthPadding = 2048) const;
  // The bytes each stored top-level property takes (namespace URI, local
  // name, size), largest first.
  std::vector<std::tuple<std::string, std::string, std::size_t>> PropertySizes() const;

 private:
  struct Edit {
    std::string ns, name;
    std::optional<Fragment> fragment;  // empty: remove
  };
  struct Change {
    std::size_t at, length;
    std::string text;
  };
  std::string Indentation(std::size_t at) const;

  std::string mText;
  PacketLayout mLayout;
  std::vector<Edit> mEdits;
};

}  // namespace detail
}  // namespace ovraxmp
