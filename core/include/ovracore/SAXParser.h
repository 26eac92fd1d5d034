// ovracore: a namespace-aware streaming XML parser (on expat).
#pragma once

#include <cstddef>
#include <cstdint>
#include <forward_list>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <utility>
#include <vector>

#include <ovracore/Strings.h>

namespace ovracore {

// Attributes of one element. Each keeps its namespace URI (empty for
// unqualified attributes). Values are already decoded by the XML parser.
// Elements carry a handful of attributes, so they sit in one small vector
// kept in (namespace URI, local name) order. The parser hands out views of
// its own buffers, valid during the call; a copy owns its texts.
class Attributes {
 public:
  struct Entry {
    std::string_view namespaceURI;
    std::string_view localName;
    std::string_view value;
    std::size_t position = 0;  // in the start tag, counted from 0
  };

  Attributes() = default;
  Attributes(const Attributes& other);
  Attributes(Attributes&&) noexcept = default;
  Attributes& operator=(const Attributes& other);
  Attributes& operator=(Attributes&&) noexcept = default;
  ~Attributes() = default;

  // Adding an attribute that is already there replaces its value.
  void Add(UTF8String namespaceURI, UTF8String localName, UTF8String value);
  // The value of an attribute, or absent.
  std::optional<UTF8String> Find(std::string_view localName, std::string_view namespaceURI = {}) const;
  // The value of an attribute, or the empty string when it is absent.
  UTF8String Get(std::string_view localName, std::string_view namespaceURI = {}) const;
  bool Has(std::string_view localName, std::string_view namespaceURI = {}) const;
  // Every attribute, ordered by namespace URI and then local name. The views
  // live as long as this object (or, in a handler, the call).
  const std::vector<Entry>& All() const { return mEntries; }
  // The same entries in the order the start tag lists them, for readers whose
  // later attributes override earlier ones.
  std::vector<Entry> InDocumentOrder() const;
  bool Empty() const { return mEntries.empty(); }

 private:
  friend class AttributesFiller;
  const Entry* Lookup(std::string_view localName, std::string_view namespaceURI) const;
  std::string_view Own(UTF8String text);

  std::vector<Entry> mEntries;
  // The texts of added and copied attributes; list nodes never move.
  std::forward_list<UTF8String> mTexts;
};

// Thrown by a handler to end the parse: the parse fails with the message as
// it stands (other exceptions are reported as a failed handler).
class ParseAbort : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Handlers derive from this class and override what they need. Elements
// without a namespace are passed by the default StartElement/EndElement on
// to StartElementNoNamespace/EndElementNoNamespace.
class AbstractParseHandler {
 public:
  virtual ~AbstractParseHandler();

  virtual void StartElement(const UTF8String& namespaceURI, const UTF8String& localName,
                            const Attributes& attributes);
  virtual void EndElement(const UTF8String& namespaceURI, const UTF8String& localName);
  virtual void StartElementNoNamespace(const UTF8String& name, const Attributes& attributes);
  virtual void EndElementNoNamespace(const UTF8String& name);
  virtual void Characters(const UTF8String& text);
  virtual void StartPrefixMapping(const UTF8String& prefix, const UTF8String& namespaceURI);
  virtual void EndPrefixMapping(const UTF8String& prefix);
};

// Limits that end a parse with a failure instead of exhausting the process.
// Documents with a DOCTYPE declaration are always refused (no entity tricks).
struct ParserLimits {
  std::size_t maxDepth = 512;
  std::size_t maxChildrenPerElement = 0;  // 0: unlimited
  std::size_t maxBytes = 256u * 1024u * 1024u;
};

class Parser {
 public:
  virtual ~Parser();
  // Parses a whole document. Returns false on malformed XML, a refused
  // construct or an exceeded limit; ErrorMessage() then says why. Events
  // before the failure have been delivered. A parser parses one document.
  virtual bool ParseBuffer(const char* data, std::size_t length) = 0;
  bool ParseBuffer(std::string_view text) { return ParseBuffer(text.data(), text.size()); }
  virtual bool ParseFile(const UTF16String& path) = 0;
  virtual UTF8String ErrorMessage() const = 0;
  // After a failure: true when a limit, a refused construct or a handler
  // ended the parse, false when the XML itself is malformed.
  virtual bool Refused() const = 0;
  // Where the event being delivered lies in the input: the byte offset of
  // its first byte and its length (a start tag, an end tag; 0 for the end
  // of an empty-element tag). Valid only inside a handler's call.
  virtual std::uint64_t CurrentByteIndex() const = 0;
  virtual std::size_t CurrentByteCount() const = 0;
};

// The handler must outlive the parser.
std::unique_ptr<Parser> GetParserWithNamespaceSupport(AbstractParseHandler& handler,
                                                      const ParserLimits& limits = {});

}  // namespace ovracore
