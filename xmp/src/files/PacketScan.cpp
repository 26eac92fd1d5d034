// The packet check and layout pass (see PacketScan.h), on core's parser.
#include "PacketScan.h"

#include <algorithm>
#include <memory>

#include <ovracore/SAXParser.h>

namespace ovraxmp {
namespace detail {
namespace {

constexpr std::string_view kRDF = "http://www.w3.org/1999/02/22-rdf-syntax-ns#";
constexpr std::string_view kXML = "http://www.w3.org/XML/1998/namespace";

bool IsSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

enum class Kind : unsigned char { kOther, kRDF, kTopDescription, kTopProperty };

struct Open {
  Kind kind;
  std::uint32_t properties;  // child elements and attributes so far
  std::size_t begin;
  std::size_t tagEnd;
};

bool IsDefaultLanguage(std::string_view tag) {
  return tag.size() == 9 && (tag == "x-default" || tag == "X-DEFAULT" || tag == "x-Default");
}

// Collects the items of one rdf:Alt (see TwoLanguageAlternative).
struct AltItems {
  std::size_t depth = 0;  // its place in the open elements, 0 when none is open
  bool usable = true;     // only simple items with a language
  std::string name;
  std::vector<std::pair<std::string, std::string>> items;  // tag, text
  std::vector<std::pair<std::size_t, std::size_t>> spans;  // of each item's content
  bool inItem = false;
};

class ScanHandler : public ovracore::AbstractParseHandler {
 public:
  ScanHandler(std::string_view text, PacketLayout* layout,
              std::vector<TwoLanguageAlternative>* alternatives)
      : mText(text), mLayout(layout), mAlternatives(alternatives) {}
  void SetParser(const ovracore::Parser* parser) { mParser = parser; }

  void StartPrefixMapping(const ovracore::UTF8String& prefix, const ovracore::UTF8String& uri) override {
    if (mLayout) mBindings.emplace_back(prefix, uri);
  }
  void EndPrefixMapping(const ovracore::UTF8String& prefix) override {
    for (auto it = mBindings.rbegin(); it != mBindings.rend(); ++it) {
      if (it->first == prefix) {
        mBindings.erase(std::next(it).base());
        break;
      }
    }
  }

  void StartElement(const ovracore::UTF8String& ns, const ovracore::UTF8String& local,
                    const ovracore::Attributes& attributes) override {
    const Kind parent = mOpen.empty() ? Kind::kOther : mOpen.back().kind;
    if (!mOpen.empty()) Count(parent == Kind::kTopDescription ? mTopLevel : mOpen.back().properties, 1);
    Kind kind = Kind::kOther;
    const bool rdfName = ns == kRDF;
    if (rdfName && local == "RDF") {
      kind = Kind::kRDF;
      mTopLevel = 0;
    } else if (parent == Kind::kRDF) {
      kind = Kind::kTopDescription;
      if (!(rdfName && local == "Description") && mLayout) mLayout->editable = false;
    } else if (parent == Kind::kTopDescription) {
      kind = Kind::kTopProperty;
    }
    std::uint32_t own = 0;
    Count(kind == Kind::kTopDescription ? mTopLevel : own, static_cast<std::uint32_t>(attributes.All().size()));
    const std::size_t begin = mParser->CurrentByteIndex();
    const std::size_t tagEnd = begin + mParser->CurrentByteCount();
    mOpen.push_back({kind, own, begin, tagEnd});
    if (mAlternatives) StartForAlternatives(rdfName, local, attributes);
    if (!mLayout) return;
    if (kind == Kind::kTopDescription) RecordDescription(begin, tagEnd);
    if (kind == Kind::kTopProperty) {
      PacketLayout::Property property;
      property.ns = ns;
      property.name = local;
      property.description = mLayout->descriptions.size() - 1;
      property.begin = begin;
      mLayout->properties.push_back(std::move(property));
    }
  }

  void Characters(const ovracore::UTF8String& text) override {
    if (mAlt.inItem) mAlt.items.back().second += text;
  }

  void EndElement(const ovracore::UTF8String&, const ovracore::UTF8String&) override {
    if (mOpen.empty()) return;
    if (mAlt.depth != 0) EndForAlternatives();
    const Open open = mOpen.back();
    mOpen.pop_back();
    if (!mLayout) return;
    const std::size_t count = mParser->CurrentByteCount();
    // An empty-element tag ends where its start tag does.
    const std::size_t end = count == 0 ? open.tagEnd : mParser->CurrentByteIndex() + count;
    if (open.kind == Kind::kTopDescription && !mLayout->descriptions.empty()) {
      PacketLayout::Description& description = mLayout->descriptions.back();
      description.empty = count == 0;
      description.closeBegin = count == 0 ? open.tagEnd : mParser->CurrentByteIndex();
    } else if (open.kind == Kind::kTopProperty) {
      mLayout->properties.back().end = end;
    }
    if (mOpen.empty()) mLayout->rootEnd = end;
  }

 private:
  void Count(std::uint32_t& count, std::uint32_t more) {
    count += std::min<std::uint32_t>(more, kMaxPropertiesPerNode + 1);
    if (count > kMaxPropertiesPerNode)
      throw ovracore::ParseAbort("more than " + std::to_string(kMaxPropertiesPerNode) + " properties on one node");
  }

  void StartForAlternatives(bool rdfName, const ovracore::UTF8String& local,
                            const ovracore::Attributes& attributes) {
    if (!rdfName) {
      if (mAlt.depth != 0) mAlt.usable = false;
      mLastName = local;
      return;
    }
    if (local == "Alt") {
      if (mAlt.depth != 0) {
        mAlt.usable = false;  // nested: not a language alternative
        return;
      }
      mAlt = AltItems();
      mAlt.depth = mOpen.size();
      mAlt.name = mLastName;
    } else if (mAlt.depth != 0) {
      const auto language = attributes.Find("lang", kXML);
      if (local != "li" || mOpen.size() != mAlt.depth + 1 || !language) {
        mAlt.usable = false;
        return;
      }
      mAlt.items.emplace_back(*language, std::string());
      mAlt.spans.emplace_back(mOpen.back().tagEnd, mOpen.back().tagEnd);
      mAlt.inItem = true;
    }
  }

  void EndForAlternatives() {
    // mOpen still holds the element that ends.
    if (mOpen.size() == mAlt.depth + 1) {
      if (mAlt.inItem && mParser->CurrentByteCount() != 0) mAlt.spans.back().second = mParser->CurrentByteIndex();
      mAlt.inItem = false;
      return;
    }
    if (mOpen.size() != mAlt.depth) return;
    const auto& items = mAlt.items;
    if (mAlt.usable && items.size() == 2 && IsDefaultLanguage(items[0].first) != IsDefaultLanguage(items[1].first)) {
      const bool defaultFirst = IsDefaultLanguage(items[0].first);
      const auto& other = items[defaultFirst ? 1 : 0];
      const auto& standard = items[defaultFirst ? 0 : 1];
      const auto& span = mAlt.spans[defaultFirst ? 1 : 0];
      mAlternatives->push_back({mAlt.name, other.first, standard.second, other.second, span.first, span.second});
    }
    mAlt = AltItems();
  }

  std::string Resolve(std::string_view prefix, const std::map<std::string, std::string>& scope) const {
    const auto found = scope.find(std::string(prefix));
    return found == scope.end() ? std::string() : found->second;
  }

  // The description's scope and the properties written as attributes of its
  // start tag, with the bytes each takes (its leading blanks included).
  void RecordDescription(std::size_t begin, std::size_t tagEnd) {
    PacketLayout::Description description;
    description.begin = begin;
    description.tagEnd = tagEnd;
    description.closeBegin = tagEnd;
    for (const auto& binding : mBindings) description.scope[binding.first] = binding.second;
    const std::size_t index = mLayout->descriptions.size();
    const std::string_view tag = mText.substr(begin, tagEnd - begin);
    std::size_t i = 1;
    while (i < tag.size() && !IsSpace(tag[i]) && tag[i] != '/' && tag[i] != '>') ++i;
    while (i < tag.size()) {
      const std::size_t spanBegin = i;
      while (i < tag.size() && IsSpace(tag[i])) ++i;
      if (i >= tag.size() || tag[i] == '/' || tag[i] == '>') break;
      const std::size_t nameBegin = i;
      while (i < tag.size() && tag[i] != '=' && !IsSpace(tag[i])) ++i;
      const std::string_view name = tag.substr(nameBegin, i - nameBegin);
      while (i < tag.size() && tag[i] != '"' && tag[i] != '\'') ++i;
      if (i >= tag.size()) break;
      const std::size_t close = tag.find(tag[i], i + 1);
      if (close == std::string_view::npos) break;
      i = close + 1;
      const std::size_t colon = name.find(':');
      if (colon == std::string_view::npos || name.substr(0, colon) == "xmlns" || name.substr(0, colon) == "xml")
        continue;
      const std::string uri = Resolve(name.substr(0, colon), description.scope);
      if (uri.empty() || uri == kRDF) continue;
      PacketLayout::Property property;
      property.ns = uri;
      property.name = std::string(name.substr(colon + 1));
      property.description = index;
      property.attribute = true;
      property.begin = begin + spanBegin;
      property.end = begin + i;
      mLayout->properties.push_back(std::move(property));
    }
    mLayout->descriptions.push_back(std::move(description));
  }

  std::string_view mText;
  PacketLayout* mLayout;
  const ovracore::Parser* mParser = nullptr;
  std::vector<Open> mOpen;
  std::uint32_t mTopLevel = 0;  // properties of every top-level rdf:Description
  std::vector<std::pair<std::string, std::string>> mBindings;
  std::vector<TwoLanguageAlternative>* mAlternatives;
  AltItems mAlt;
  std::string mLastName;  // of the last element outside the RDF namespace
};

// Edits insert UTF-8 text, so only UTF-8 packets can be edited in place.
bool LooksUTF8(std::string_view text) {
  if (text.size() >= 2 && (static_cast<unsigned char>(text[0]) == 0xFE || static_cast<unsigned char>(text[0]) == 0xFF))
    return false;
  const std::size_t firstTag = text.find('<');
  if (firstTag == std::string_view::npos || text.substr(0, firstTag + 2).find('\0') != std::string_view::npos)
    return false;
  const std::size_t declaration = text.find("<?xml ");
  if (declaration != std::string_view::npos && declaration < 16) {
    const std::string_view head = text.substr(declaration, text.find("?>", declaration) - declaration);
    const std::size_t encoding = head.find("encoding=");
    if (encoding != std::string_view::npos) {
      std::string name(head.substr(encoding + 10, 5));
      for (char& c : name) c = static_cast<char>(c >= 'a' && c <= 'z' ? c - 32 : c);
      if (name != "UTF-8") return false;
    }
  }
  return true;
}

}  // namespace

bool ScanPacket(std::string_view text, std::string* problem, PacketLayout* layout, bool* refused,
                std::vector<TwoLanguageAlternative>* alternatives) {
  if (refused) *refused = true;
  // Trailing NULs are padding some writers leave after an 8-bit packet; the
  // toolkit ignores them.
  const bool wide = text.size() >= 2 && (text[0] == '\0' || text[1] == '\0' ||
                                         static_cast<unsigned char>(text[0]) >= 0xFE);
  while (!wide && !text.empty() && text.back() == '\0') text.remove_suffix(1);
  if (text.size() > kMaxPacketBytes) {
    if (problem) *problem = "packet larger than " + std::to_string(kMaxPacketBytes >> 20) + " MB";
    return false;
  }
  if (layout) *layout = PacketLayout();
  if (alternatives) alternatives->clear();
  ScanHandler handler(text, layout, alternatives);
  ovracore::ParserLimits limits;
  limits.maxDepth = kMaxNestingDepth;
  limits.maxBytes = kMaxPacketBytes;
  const std::unique_ptr<ovracore::Parser> parser = ovracore::GetParserWithNamespaceSupport(handler, limits);
  handler.SetParser(parser.get());
  if (!parser->ParseBuffer(text)) {
    if (problem) *problem = parser->ErrorMessage();
    if (refused) *refused = parser->Refused();
    return false;
  }
  if (layout && (!LooksUTF8(text) || layout->descriptions.empty())) layout->editable = false;
  return true;
}

}  // namespace detail
}  // namespace ovraxmp
