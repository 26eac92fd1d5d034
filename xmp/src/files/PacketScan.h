// Not part of the interface: one pass of core's XML parser over a packet,
// which checks the bounds that keep hostile XML away from the toolkit
// (whose RDF reader recurses per element and searches a node's properties
// linearly) and records where each top-level property is written, so that
// a write can change those properties and leave every other byte alone.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace ovraxmp {
namespace detail {

// Real packets stay far below: a few dozen levels, a few thousand items in
// the largest array, a few MB.
constexpr std::size_t kMaxNestingDepth = 512;
constexpr std::uint32_t kMaxPropertiesPerNode = 50000;
constexpr std::uint64_t kMaxPacketBytes = 256ull << 20;

struct PacketLayout {
  struct Description {
    std::size_t begin = 0;      // the '<' of its start tag
    std::size_t tagEnd = 0;     // just past the start tag
    std::size_t closeBegin = 0; // the '<' of its end tag; tagEnd when it has none
    bool empty = false;         // written as one empty-element tag
    std::map<std::string, std::string> scope;  // prefix -> URI inside its start tag
  };
  struct Property {
    std::string ns;
    std::string name;  // local name
    std::size_t description = 0;
    bool attribute = false;
    std::size_t begin = 0, end = 0;  // the element, or " name='value'" in the start tag
  };
  std::vector<Description> descriptions;
  std::vector<Property> properties;
  std::size_t rootEnd = 0;  // just past the end of the outermost element
  // False when the packet is written in a form edits cannot follow (node
  // elements other than rdf:Description, text that is not UTF-8).
  bool editable = true;
};

// A language alternative of exactly two items, "x-default" and one other,
// as written. The toolkit's reader and its serialiser both give such an
// other item the default's text; the layer puts the right text back.
struct TwoLanguageAlternative {
  std::string name;      // local name of the property or field that holds it
  std::string language;  // the other item's tag
  std::string defaultText, text;
  // Where the other item's content is written; equal when it cannot be
  // replaced in place (an empty-element tag).
  std::size_t textBegin = 0, textEnd = 0;
};

// Checks the packet: nesting up to kMaxNestingDepth, at most
// kMaxPropertiesPerNode properties on one node (child elements and
// attributes; the properties of every top-level rdf:Description count
// together, since the toolkit merges them into one schema node), at most
// kMaxPacketBytes, no DOCTYPE, well-formed XML in a valid encoding. False
// with the reason when refused. With layout, also records the layout.
// refused, when given, tells a refusal (limits, DOCTYPE) from malformed XML.
// alternatives, when given, gets every TwoLanguageAlternative, in document
// order.
bool ScanPacket(std::string_view text, std::string* problem, PacketLayout* layout = nullptr,
                bool* refused = nullptr, std::vector<TwoLanguageAlternative>* alternatives = nullptr);

}  // namespace detail
}  // namespace ovraxmp
