#include <ovracore/SAXParser.h>

#include <algorithm>
#include <exception>
#include <fstream>
#include <string>
#include <type_traits>
#include <vector>

#include <expat.h>

#include <ovracore/FileSupport.h>

namespace ovracore {

// ---------------------------------------------------------------- Attributes

namespace {

bool EntryLess(const Attributes::Entry& a, const Attributes::Entry& b) {
  const int byNamespace = a.namespaceURI.compare(b.namespaceURI);
  return byNamespace != 0 ? byNamespace < 0 : a.localName < b.localName;
}

}  // namespace

Attributes::Attributes(const Attributes& other) : mEntries(other.mEntries) {
  for (Entry& entry : mEntries) {
    entry.namespaceURI = Own(UTF8String(entry.namespaceURI));
    entry.localName = Own(UTF8String(entry.localName));
    entry.value = Own(UTF8String(entry.value));
  }
}

Attributes& Attributes::operator=(const Attributes& other) {
  if (this != &other) *this = Attributes(other);
  return *this;
}

std::string_view Attributes::Own(UTF8String text) {
  mTexts.push_front(std::move(text));
  return mTexts.front();
}

void Attributes::Add(UTF8String namespaceURI, UTF8String localName, UTF8String value) {
  Entry entry{namespaceURI, localName, {}};
  const auto it = std::lower_bound(mEntries.begin(), mEntries.end(), entry, &EntryLess);
  if (it != mEntries.end() && !EntryLess(entry, *it)) {
    it->value = Own(std::move(value));
    return;
  }
  entry.namespaceURI = Own(std::move(namespaceURI));
  entry.localName = Own(std::move(localName));
  entry.value = Own(std::move(value));
  entry.position = mEntries.size();
  mEntries.insert(it, entry);
}

std::vector<Attributes::Entry> Attributes::InDocumentOrder() const {
  std::vector<Entry> ordered(mEntries);
  std::sort(ordered.begin(), ordered.end(),
            [](const Entry& a, const Entry& b) { return a.position < b.position; });
  return ordered;
}

const Attributes::Entry* Attributes::Lookup(std::string_view localName,
                                            std::string_view namespaceURI) const {
  for (const Entry& entry : mEntries) {
    if (entry.localName == localName && entry.namespaceURI == namespaceURI) return &entry;
  }
  return nullptr;
}

std::optional<UTF8String> Attributes::Find(std::string_view localName,
                                           std::string_view namespaceURI) const {
  const Entry* entry = Lookup(localName, namespaceURI);
  if (!entry) return std::nullopt;
  return UTF8String(entry->value);
}

UTF8String Attributes::Get(std::string_view localName, std::string_view namespaceURI) const {
  const Entry* entry = Lookup(localName, namespaceURI);
  return entry ? UTF8String(entry->value) : UTF8String();
}

bool Attributes::Has(std::string_view localName, std::string_view namespaceURI) const {
  return Lookup(localName, namespaceURI) != nullptr;
}

// ------------------------------------------------------ AbstractParseHandler

AbstractParseHandler::~AbstractParseHandler() = default;

void AbstractParseHandler::StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                                        const Attributes& attributes) {
  if (namespaceURI.empty()) StartElementNoNamespace(localName, attributes);
}

void AbstractParseHandler::EndElement(const UTF8String& namespaceURI, const UTF8String& localName) {
  if (namespaceURI.empty()) EndElementNoNamespace(localName);
}

void AbstractParseHandler::StartElementNoNamespace(const UTF8String&, const Attributes&) {}
void AbstractParseHandler::EndElementNoNamespace(const UTF8String&) {}
void AbstractParseHandler::Characters(const UTF8String&) {}
void AbstractParseHandler::StartPrefixMapping(const UTF8String&, const UTF8String&) {}
void AbstractParseHandler::EndPrefixMapping(const UTF8String&) {}

Parser::~Parser() = default;

// -------------------------------------------------------------- ExpatParser

namespace {

// Separates namespace URI and local name in the names expat hands out. It is
// no XML character, so it can never be part of a URI.
constexpr char kNamespaceSeparator = '\x01';
constexpr std::size_t kReadChunk = 64 * 1024;

struct ParserDeleter {
  void operator()(XML_Parser parser) const { XML_ParserFree(parser); }
};
using ParserHandle = std::unique_ptr<std::remove_pointer_t<XML_Parser>, ParserDeleter>;

void SplitName(const XML_Char* name, UTF8String& namespaceURI, UTF8String& localName) {
  const std::string_view full(name);
  const std::size_t sep = full.find(kNamespaceSeparator);
  if (sep == std::string_view::npos) {
    namespaceURI.clear();
    localName.assign(full);
  } else {
    namespaceURI.assign(full.substr(0, sep));
    localName.assign(full.substr(sep + 1));
  }
}

}  // namespace

// Fills one Attributes object element after element with views of the
// names and values expat hands out: nothing is copied.
class AttributesFiller {
 public:
  static void Fill(Attributes& target, const XML_Char** atts) {
    std::vector<Attributes::Entry>& entries = target.mEntries;
    entries.clear();
    target.mTexts.clear();
    for (const XML_Char** a = atts; a && *a; a += 2) {
      const std::string_view full(a[0]);
      const std::size_t sep = full.find(kNamespaceSeparator);
      Attributes::Entry entry{{}, full, a[1] ? a[1] : "", entries.size()};
      if (sep != std::string_view::npos) {
        entry.namespaceURI = full.substr(0, sep);
        entry.localName = full.substr(sep + 1);
      }
      // Few attributes: an insertion sort, stable so that of two equal
      // names the later one stays below.
      std::size_t at = entries.size();
      entries.push_back(entry);
      while (at > 0 && EntryLess(entry, entries[at - 1])) {
        entries[at] = entries[at - 1];
        --at;
      }
      entries[at] = entry;
    }
    // expat refuses repeated attributes; should one get through, it
    // replaces the earlier one as Add does.
    for (std::size_t i = 1; i < entries.size();) {
      if (!EntryLess(entries[i - 1], entries[i])) {
        entries.erase(entries.begin() + static_cast<std::ptrdiff_t>(i) - 1);
      } else {
        ++i;
      }
    }
  }
};

namespace {

class ExpatParser final : public Parser {
 public:
  ExpatParser(AbstractParseHandler& handler, const ParserLimits& limits)
      : mHandler(handler), mLimits(limits), mParser(XML_ParserCreateNS(nullptr, kNamespaceSeparator)) {
    if (!mParser) {
      mError = "cannot create the XML parser";
      return;
    }
    XML_Parser p = mParser.get();
    XML_SetUserData(p, this);
    XML_SetElementHandler(p, &ExpatParser::OnStartElement, &ExpatParser::OnEndElement);
    XML_SetCharacterDataHandler(p, &ExpatParser::OnCharacters);
    XML_SetNamespaceDeclHandler(p, &ExpatParser::OnStartNamespace, &ExpatParser::OnEndNamespace);
    // No document type declarations at all: they are the door to entity
    // expansion and external entity attacks, and no file of ours has one.
    XML_SetStartDoctypeDeclHandler(p, &ExpatParser::OnDoctype);
    XML_SetEntityDeclHandler(p, &ExpatParser::OnEntityDecl);
    XML_SetParamEntityParsing(p, XML_PARAM_ENTITY_PARSING_NEVER);
  }

  bool ParseBuffer(const char* data, std::size_t length) override {
    if (!Begin()) return false;
    if (length > mLimits.maxBytes) return Fail("document larger than " + std::to_string(mLimits.maxBytes) + " bytes");
    // expat takes int lengths; feed big buffers in pieces. The last piece
    // goes in as final: after a piece that is not, expat walks the whole
    // piece again to keep its line count (error messages count lines anyway).
    std::size_t offset = 0;
    while (true) {
      const std::size_t piece = std::min<std::size_t>(length - offset, 1u << 30);
      const bool last = offset + piece == length;
      if (!Feed(data + offset, piece, last)) return false;
      if (last) return true;
      offset += piece;
    }
  }

  bool ParseFile(const UTF16String& path) override {
    if (!Begin()) return false;
    std::ifstream in(filesupport::ToFSPath(path), std::ios::binary);
    if (!in) return Fail("cannot open " + ToUTF8(path));
    std::size_t total = 0;
    while (true) {
      // Read straight into expat's buffer: no copy, no buffer of our own.
      void* buffer = XML_GetBuffer(mParser.get(), static_cast<int>(kReadChunk));
      if (!buffer) return Fail("cannot read " + ToUTF8(path) + ": out of memory");
      in.read(static_cast<char*>(buffer), static_cast<std::streamsize>(kReadChunk));
      const auto got = static_cast<std::size_t>(in.gcount());
      if (in.bad()) return Fail("cannot read " + ToUTF8(path));
      total += got;
      if (total > mLimits.maxBytes)
        return Fail("document larger than " + std::to_string(mLimits.maxBytes) + " bytes");
      // A short read is the end of the file: that chunk is the final one
      // (see ParseBuffer).
      const bool last = !in;
      if (!FeedBuffer(got, last)) return false;
      if (last) return true;
    }
  }

  UTF8String ErrorMessage() const override { return mError; }
  bool Refused() const override { return mRefused; }
  std::uint64_t CurrentByteIndex() const override {
    const XML_Index index = XML_GetCurrentByteIndex(mParser.get());
    return index < 0 ? 0 : static_cast<std::uint64_t>(index);
  }
  std::size_t CurrentByteCount() const override {
    const int count = XML_GetCurrentByteCount(mParser.get());
    return count < 0 ? 0 : static_cast<std::size_t>(count);
  }

 private:
  bool Begin() {
    if (!mParser) return false;
    if (mUsed) return Fail("the parser has already parsed a document");
    mUsed = true;
    return true;
  }

  bool Fail(const std::string& message) {
    if (mError.empty()) mError = message;
    mRefused = true;
    return false;
  }

  // Passes bytes to expat; false when the parse has failed (by expat or by us).
  bool Feed(const char* data, std::size_t length, bool isFinal) {
    return Parsed(XML_Parse(mParser.get(), data, static_cast<int>(length), isFinal), isFinal);
  }

  // The same for bytes already placed in the buffer of XML_GetBuffer.
  bool FeedBuffer(std::size_t length, bool isFinal) {
    return Parsed(XML_ParseBuffer(mParser.get(), static_cast<int>(length), isFinal), isFinal);
  }

  bool Parsed(XML_Status status, bool isFinal) {
    if (status == XML_STATUS_OK && mError.empty()) {
      if (isFinal) Guarded([this] { FlushCharacters(); });
      return mError.empty();
    }
    if (mError.empty()) {
      const XML_Error code = XML_GetErrorCode(mParser.get());
      mError = "line " + std::to_string(XML_GetCurrentLineNumber(mParser.get())) + ", column " +
               std::to_string(XML_GetCurrentColumnNumber(mParser.get())) + ": " +
               (XML_ErrorString(code) ? XML_ErrorString(code) : "XML error");
    }
    return false;
  }

  // Records the first failure and stops expat; later events are ignored.
  void Stop(const std::string& message) noexcept {
    try {
      if (mError.empty()) {
        mError = "line " + std::to_string(XML_GetCurrentLineNumber(mParser.get())) + ": " + message;
      }
    } catch (...) {
      // Nothing left to say when even the message cannot be built.
    }
    mStopped = true;
    mRefused = true;
    XML_StopParser(mParser.get(), XML_FALSE);
  }

  template <class F>
  void Guarded(F&& f) noexcept {
    if (mStopped) return;
    try {
      f();
    } catch (const ParseAbort& e) {
      Stop(e.what());
    } catch (const std::exception& e) {
      Stop(std::string("handler failed: ") + e.what());
    } catch (...) {
      Stop("handler failed");
    }
  }

  void FlushCharacters() {
    if (mText.empty() || mStopped) return;
    // Cleared after the call, so that the buffer's storage serves the next text.
    mHandler.Characters(mText);
    mText.clear();
  }

  static ExpatParser& Self(void* data) { return *static_cast<ExpatParser*>(data); }

  static void XMLCALL OnStartElement(void* data, const XML_Char* name, const XML_Char** atts) noexcept {
    ExpatParser& self = Self(data);
    self.Guarded([&] {
      self.FlushCharacters();
      if (self.mDepth >= self.mLimits.maxDepth) {
        self.Stop("elements nested deeper than " + std::to_string(self.mLimits.maxDepth));
        return;
      }
      if (!self.mChildCounts.empty()) {
        std::size_t& siblings = self.mChildCounts.back();
        if (self.mLimits.maxChildrenPerElement != 0 && siblings >= self.mLimits.maxChildrenPerElement) {
          self.Stop("more than " + std::to_string(self.mLimits.maxChildrenPerElement) +
                    " children in one element");
          return;
        }
        ++siblings;
      }
      ++self.mDepth;
      self.mChildCounts.push_back(0);

      AttributesFiller::Fill(self.mAttributes, atts);
      SplitName(name, self.mNamespaceURI, self.mLocalName);
      self.mHandler.StartElement(self.mNamespaceURI, self.mLocalName, self.mAttributes);
    });
  }

  static void XMLCALL OnEndElement(void* data, const XML_Char* name) noexcept {
    ExpatParser& self = Self(data);
    self.Guarded([&] {
      self.FlushCharacters();
      if (self.mDepth > 0) --self.mDepth;
      if (!self.mChildCounts.empty()) self.mChildCounts.pop_back();
      SplitName(name, self.mNamespaceURI, self.mLocalName);
      self.mHandler.EndElement(self.mNamespaceURI, self.mLocalName);
    });
  }

  static void XMLCALL OnCharacters(void* data, const XML_Char* text, int length) noexcept {
    ExpatParser& self = Self(data);
    // expat splits text at line ends and buffer boundaries; handlers get it whole.
    self.Guarded([&] { self.mText.append(text, static_cast<std::size_t>(length)); });
  }

  static void XMLCALL OnStartNamespace(void* data, const XML_Char* prefix, const XML_Char* uri) noexcept {
    ExpatParser& self = Self(data);
    self.Guarded([&] {
      self.FlushCharacters();
      self.mHandler.StartPrefixMapping(prefix ? prefix : "", uri ? uri : "");
    });
  }

  static void XMLCALL OnEndNamespace(void* data, const XML_Char* prefix) noexcept {
    ExpatParser& self = Self(data);
    self.Guarded([&] {
      self.FlushCharacters();
      self.mHandler.EndPrefixMapping(prefix ? prefix : "");
    });
  }

  static void XMLCALL OnDoctype(void* data, const XML_Char*, const XML_Char*, const XML_Char*, int) noexcept {
    Self(data).Stop("document type declarations are not accepted");
  }

  static void XMLCALL OnEntityDecl(void* data, const XML_Char*, int, const XML_Char*, int, const XML_Char*,
                                   const XML_Char*, const XML_Char*, const XML_Char*) noexcept {
    Self(data).Stop("entity declarations are not accepted");
  }

  AbstractParseHandler& mHandler;
  ParserLimits mLimits;
  ParserHandle mParser;
  UTF8String mError;
  bool mRefused = false;
  UTF8String mText;
  // Reused from element to element, to keep their storage.
  Attributes mAttributes;
  UTF8String mNamespaceURI;
  UTF8String mLocalName;
  std::vector<std::size_t> mChildCounts;
  std::size_t mDepth = 0;
  bool mUsed = false;
  bool mStopped = false;
};

}  // namespace

std::unique_ptr<Parser> GetParserWithNamespaceSupport(AbstractParseHandler& handler,
                                                      const ParserLimits& limits) {
  return std::make_unique<ExpatParser>(handler, limits);
}

}  // namespace ovracore
