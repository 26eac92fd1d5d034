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

void Attributes::Add(UTF8String namespaceURI, UTF8String localName, UTF8String value) {
  mValues[Key(std::move(namespaceURI), std::move(localName))] = std::move(value);
}

std::optional<UTF8String> Attributes::Find(std::string_view localName,
                                           std::string_view namespaceURI) const {
  const auto it = mValues.find(Key(UTF8String(namespaceURI), UTF8String(localName)));
  if (it == mValues.end()) return std::nullopt;
  return it->second;
}

UTF8String Attributes::Get(std::string_view localName, std::string_view namespaceURI) const {
  return Find(localName, namespaceURI).value_or(UTF8String());
}

bool Attributes::Has(std::string_view localName, std::string_view namespaceURI) const {
  return mValues.count(Key(UTF8String(namespaceURI), UTF8String(localName))) != 0;
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
    // expat takes int lengths; feed big buffers in pieces.
    std::size_t offset = 0;
    do {
      const std::size_t piece = std::min<std::size_t>(length - offset, 1u << 30);
      if (!Feed(data + offset, piece, false)) return false;
      offset += piece;
    } while (offset < length);
    return Feed(nullptr, 0, true);
  }

  bool ParseFile(const UTF16String& path) override {
    if (!Begin()) return false;
    std::ifstream in(filesupport::ToFSPath(path), std::ios::binary);
    if (!in) return Fail("cannot open " + ToUTF8(path));
    std::vector<char> buffer(kReadChunk);
    std::size_t total = 0;
    while (true) {
      in.read(buffer.data(), static_cast<std::streamsize>(buffer.size()));
      const auto got = static_cast<std::size_t>(in.gcount());
      if (in.bad()) return Fail("cannot read " + ToUTF8(path));
      total += got;
      if (total > mLimits.maxBytes)
        return Fail("document larger than " + std::to_string(mLimits.maxBytes) + " bytes");
      if (got == 0) break;
      if (!Feed(buffer.data(), got, false)) return false;
      if (!in) break;
    }
    return Feed(nullptr, 0, true);
  }

  UTF8String ErrorMessage() const override { return mError; }

 private:
  bool Begin() {
    if (!mParser) return false;
    if (mUsed) return Fail("the parser has already parsed a document");
    mUsed = true;
    return true;
  }

  bool Fail(const std::string& message) {
    if (mError.empty()) mError = message;
    return false;
  }

  // Passes bytes to expat; false when the parse has failed (by expat or by us).
  bool Feed(const char* data, std::size_t length, bool isFinal) {
    const XML_Status status = XML_Parse(mParser.get(), data, static_cast<int>(length), isFinal);
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
    XML_StopParser(mParser.get(), XML_FALSE);
  }

  template <class F>
  void Guarded(F&& f) noexcept {
    if (mStopped) return;
    try {
      f();
    } catch (const std::exception& e) {
      Stop(std::string("handler failed: ") + e.what());
    } catch (...) {
      Stop("handler failed");
    }
  }

  void FlushCharacters() {
    if (mText.empty() || mStopped) return;
    UTF8String text;
    text.swap(mText);
    mHandler.Characters(text);
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

      UTF8String ns;
      UTF8String local;
      Attributes attributes;
      for (const XML_Char** a = atts; a && *a; a += 2) {
        SplitName(a[0], ns, local);
        attributes.Add(ns, local, a[1] ? a[1] : "");
      }
      SplitName(name, ns, local);
      self.mHandler.StartElement(ns, local, attributes);
    });
  }

  static void XMLCALL OnEndElement(void* data, const XML_Char* name) noexcept {
    ExpatParser& self = Self(data);
    self.Guarded([&] {
      self.FlushCharacters();
      if (self.mDepth > 0) --self.mDepth;
      if (!self.mChildCounts.empty()) self.mChildCounts.pop_back();
      UTF8String ns;
      UTF8String local;
      SplitName(name, ns, local);
      self.mHandler.EndElement(ns, local);
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
  UTF8String mText;
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
