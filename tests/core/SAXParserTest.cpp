#include <stdexcept>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <ovracore/SAXParser.h>

#include "TestSupport.h"

using namespace ovracore;

namespace {

// Records every event as one line, the way a reader of the document would
// list them.
class Recorder : public AbstractParseHandler {
 public:
  std::vector<std::string> events;

  void StartElement(const UTF8String& ns, const UTF8String& local, const Attributes& attrs) override {
    std::string line = "start {" + ns + "}" + local;
    for (const Attributes::Entry& a : attrs.All()) {
      line += " {" + std::string(a.namespaceURI) + "}" + std::string(a.localName) + "=" + std::string(a.value);
    }
    events.push_back(line);
    AbstractParseHandler::StartElement(ns, local, attrs);  // routes unqualified ones
  }
  void EndElement(const UTF8String& ns, const UTF8String& local) override {
    events.push_back("end {" + ns + "}" + local);
    AbstractParseHandler::EndElement(ns, local);
  }
  void StartElementNoNamespace(const UTF8String& name, const Attributes& attrs) override {
    events.push_back("plain-start " + name + " " + std::to_string(attrs.All().size()));
  }
  void EndElementNoNamespace(const UTF8String& name) override { events.push_back("plain-end " + name); }
  void Characters(const UTF8String& text) override { events.push_back("text " + text); }
  void StartPrefixMapping(const UTF8String& prefix, const UTF8String& uri) override {
    events.push_back("map " + prefix + "=" + uri);
  }
  void EndPrefixMapping(const UTF8String& prefix) override { events.push_back("unmap " + prefix); }
};

bool Parse(AbstractParseHandler& handler, std::string_view xml, std::string* error = nullptr,
           const ParserLimits& limits = {}) {
  const std::unique_ptr<Parser> parser = GetParserWithNamespaceSupport(handler, limits);
  const bool ok = parser->ParseBuffer(xml);
  if (error) *error = parser->ErrorMessage();
  return ok;
}

std::string Nested(int depth) {
  std::string xml;
  for (int i = 0; i < depth; ++i) xml += "<a>";
  for (int i = 0; i < depth; ++i) xml += "</a>";
  return xml;
}

}  // namespace

TEST(SAXParser, NamespacesPrefixEventsAndAttributes) {
  Recorder r;
  ASSERT_TRUE(Parse(r,
                    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
                    "<ui:views xmlns:ui=\"urn:ui\" xmlns=\"urn:default\" ui:name=\"v\" plain=\"&lt;1&gt;\">"
                    "<item/>"
                    "<x:item xmlns:x=\"urn:x\" x:k=\"&#233;\"/>"
                    "</ui:views>"));
  EXPECT_EQ(r.events, (std::vector<std::string>{
                          "map ui=urn:ui",
                          "map =urn:default",
                          "start {urn:ui}views {}plain=<1> {urn:ui}name=v",
                          "start {urn:default}item",
                          "end {urn:default}item",
                          "map x=urn:x",
                          "start {urn:x}item {urn:x}k=\xC3\xA9",
                          "end {urn:x}item",
                          "unmap x",
                          "end {urn:ui}views",
                          "unmap ",  // mappings end in reverse order
                          "unmap ui",
                      }));
}

TEST(SAXParser, UnqualifiedElementsReachNoNamespaceHandlersAndTextComesWhole) {
  Recorder r;
  ASSERT_TRUE(Parse(r, "<xmp_definitions><xmp_schema a=\"1\" b=\"2\">line1\nline2 &amp; more</xmp_schema>"
                       "<u:sep xmlns:u=\"urn:u\"/></xmp_definitions>"));
  EXPECT_EQ(r.events, (std::vector<std::string>{
                          "start {}xmp_definitions",
                          "plain-start xmp_definitions 0",
                          "start {}xmp_schema {}a=1 {}b=2",
                          "plain-start xmp_schema 2",
                          "text line1\nline2 & more",
                          "end {}xmp_schema",
                          "plain-end xmp_schema",
                          "map u=urn:u",
                          "start {urn:u}sep",
                          "end {urn:u}sep",
                          "unmap u",
                          "end {}xmp_definitions",
                          "plain-end xmp_definitions",
                      }));
}

TEST(SAXParser, AttributeLookupKeepsNamespaces) {
  struct Grab : AbstractParseHandler {
    Attributes attrs;
    void StartElement(const UTF8String&, const UTF8String&, const Attributes& a) override { attrs = a; }
  } g;
  ASSERT_TRUE(Parse(g, "<r xmlns:p=\"urn:p\" name=\"plain\" p:name=\"qualified\"/>"));
  EXPECT_EQ(g.attrs.Get("name"), "plain");
  EXPECT_EQ(g.attrs.Get("name", "urn:p"), "qualified");
  EXPECT_FALSE(g.attrs.Find("name", "urn:other"));
  EXPECT_TRUE(g.attrs.Has("name", "urn:p"));
  EXPECT_EQ(g.attrs.Get("missing"), "");
}

TEST(SAXParser, MalformedDocumentsFailAfterDeliveringEarlierEvents) {
  for (const char* bad : {"<a><b></a>", "<a>", "", "just text", "<a x=\"1\" x=\"2\"/>", "<p:a/>",
                          "<a/><b/>", "<a>&undefined;</a>", "<a>\xFF</a>"}) {
    Recorder r;
    std::string error;
    EXPECT_FALSE(Parse(r, bad, &error)) << bad;
    EXPECT_FALSE(error.empty()) << bad;
  }
  Recorder r;
  EXPECT_FALSE(Parse(r, "<a><b/><c></a>"));
  ASSERT_GE(r.events.size(), 3u);
  EXPECT_EQ(r.events[2], "start {}b");
}

TEST(SAXParser, DoctypeAndEntityAttacksAreRefused) {
  std::string laughs = "<?xml version=\"1.0\"?><!DOCTYPE lolz [<!ENTITY lol0 \"lol\">";
  for (int level = 1; level <= 9; ++level) {
    laughs += "<!ENTITY lol" + std::to_string(level) + " \"";
    for (int i = 0; i < 10; ++i) laughs += "&lol" + std::to_string(level - 1) + ";";
    laughs += "\">";
  }
  laughs += "]><lolz>&lol9;</lolz>";
  for (const std::string& xml :
       {laughs, std::string("<!DOCTYPE r [<!ENTITY secret SYSTEM \"file:///etc/passwd\">]><r>&secret;</r>"),
        std::string("<!DOCTYPE r><r/>")}) {
    Recorder r;
    std::string error;
    EXPECT_FALSE(Parse(r, xml, &error));
    EXPECT_NE(error.find("document type"), std::string::npos) << error;
    EXPECT_TRUE(r.events.empty());
  }
}

TEST(SAXParser, DepthChildrenAndSizeLimits) {
  ParserLimits few;
  few.maxChildrenPerElement = 3;
  ParserLimits small;
  small.maxBytes = 17;
  const struct {
    std::string xml;
    ParserLimits limits;
    bool ok;
    const char* errorWord;
  } cases[] = {
      {Nested(512), {}, true, ""},
      {Nested(513), {}, false, "nested"},
      {Nested(200000), {}, false, ""},
      {"<r><a/><b><x/><y/><z/></b><c/></r>", few, true, ""},
      {"<r><a/><b/><c/><d/></r>", few, false, "children"},
      {"<r>0123456789</r>", small, true, ""},
      {"<r>0123456789 </r>", small, false, ""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.xml.substr(0, 40));
    Recorder r;
    std::string error;
    EXPECT_EQ(Parse(r, c.xml, &error, c.limits), c.ok);
    EXPECT_NE(error.find(c.errorWord), std::string::npos) << error;
  }
}

TEST(SAXParser, HandlerExceptionEndsParseWithFailure) {
  struct Throwing : Recorder {
    void StartElementNoNamespace(const UTF8String& name, const Attributes&) override {
      if (name == "boom") throw std::runtime_error("no boom allowed");
      events.push_back("plain-start " + name);
    }
  } t;
  std::string error;
  EXPECT_FALSE(Parse(t, "<r><boom/><after/></r>", &error));
  EXPECT_NE(error.find("no boom allowed"), std::string::npos) << error;
  for (const std::string& e : t.events) EXPECT_EQ(e.find("after"), std::string::npos) << e;
}

TEST(SAXParser, ParsesFilesAndOnlyOneDocument) {
  ovratest::TempDir dir;
  // UTF-16 with a byte order mark: expat converts it to UTF-8 for us.
  std::string utf16 = "\xFF\xFE";
  for (char c : std::string("<r a=\"1\">\xE9</r>")) {
    utf16.push_back(c);
    utf16.push_back('\0');
  }
  ovratest::WriteFile(dir / "doc.xml", utf16);
  Recorder r;
  const std::unique_ptr<Parser> parser = GetParserWithNamespaceSupport(r);
  ASSERT_TRUE(parser->ParseFile(ToUTF16((dir / "doc.xml").string()))) << parser->ErrorMessage();
  EXPECT_EQ(r.events[2], "text \xC3\xA9");
  EXPECT_FALSE(parser->ParseBuffer("<r/>"));

  Recorder missing;
  const std::unique_ptr<Parser> other = GetParserWithNamespaceSupport(missing);
  EXPECT_FALSE(other->ParseFile(ToUTF16((dir / "absent.xml").string())));
  EXPECT_FALSE(other->ErrorMessage().empty());
}

TEST(SAXParser, AttributesKeepOneValuePerNameInNameOrder) {
  Attributes attrs;
  attrs.Add("", "type", "text");
  attrs.Add("urn:ui", "multiLine", "true");
  attrs.Add("", "name", "first");
  attrs.Add("", "name", "second");  // replaces
  std::vector<std::string> listed;
  for (const Attributes::Entry& a : attrs.All()) {
    listed.push_back("{" + std::string(a.namespaceURI) + "}" + std::string(a.localName) + "=" +
                     std::string(a.value));
  }
  EXPECT_EQ(listed, (std::vector<std::string>{"{}name=second", "{}type=text", "{urn:ui}multiLine=true"}));
  EXPECT_EQ(attrs.Get("name"), "second");
  EXPECT_FALSE(attrs.Has("multiLine"));
  EXPECT_EQ(attrs.Find("multiLine", "urn:ui"), std::optional<std::string>("true"));

  // Copies own their texts: they outlive the original.
  std::optional<Attributes> original(attrs);
  original->Add("", "label", std::string(40, 'L'));
  Attributes copied(*original);
  Attributes assigned;
  assigned = *original;
  original.reset();
  for (const Attributes* copy : {&copied, &assigned}) {
    EXPECT_EQ(copy->Get("label"), std::string(40, 'L'));
    EXPECT_EQ(copy->Get("name"), "second");
    EXPECT_EQ(copy->All().size(), 4u);
  }

  // Elements one after the other: each sees only its own attributes.
  Recorder r;
  ASSERT_TRUE(Parse(r, "<r z=\"1\" a=\"2\" m=\"3\"><e only=\"x\"/><e/><e b=\"y\" a=\"z\"/></r>"));
  EXPECT_EQ(r.events, (std::vector<std::string>{
                          "start {}r {}a=2 {}m=3 {}z=1", "plain-start r 3",
                          "start {}e {}only=x", "plain-start e 1", "end {}e", "plain-end e",
                          "start {}e", "plain-start e 0", "end {}e", "plain-end e",
                          "start {}e {}a=z {}b=y", "plain-start e 2", "end {}e", "plain-end e",
                          "end {}r", "plain-end r",
                      }));
}

TEST(SAXParser, FilesAroundTheReadChunkSizeParseWhole) {
  ovratest::TempDir dir;
  // The reader takes 64 KiB at a time: sizes just below, at and above it,
  // and a few chunks.
  for (const std::size_t size : {std::size_t{65535}, std::size_t{65536}, std::size_t{65537}, std::size_t{200000}}) {
    const std::string text(size - 7, 'x');
    ovratest::WriteFile(dir / "doc.xml", "<r>" + text + "</r>");
    Recorder r;
    const std::unique_ptr<Parser> parser = GetParserWithNamespaceSupport(r);
    ASSERT_TRUE(parser->ParseFile(ToUTF16((dir / "doc.xml").string()))) << size << parser->ErrorMessage();
    ASSERT_EQ(r.events.size(), 5u) << size;
    EXPECT_EQ(r.events[2], "text " + text) << size;

    // A fault in the last chunk still names its line.
    ovratest::WriteFile(dir / "bad.xml", "<r>" + text + "\n\n</x>");
    Recorder bad;
    const std::unique_ptr<Parser> failing = GetParserWithNamespaceSupport(bad);
    EXPECT_FALSE(failing->ParseFile(ToUTF16((dir / "bad.xml").string()))) << size;
    EXPECT_EQ(failing->ErrorMessage().rfind("line 3,", 0), 0u) << failing->ErrorMessage();
  }
  Recorder r;
  std::string error;
  EXPECT_FALSE(Parse(r, "<r>\n<a/>\n</x>", &error));
  EXPECT_EQ(error.rfind("line 3,", 0), 0u) << error;
}
