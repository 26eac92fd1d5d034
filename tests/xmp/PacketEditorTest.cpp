// Edits of a stored packet's text: the shapes writers leave that edits must
// follow (descriptions written as one empty tag, prefixes bound to other
// namespaces, packets other than UTF-8) and the packet's length.
#include <gtest/gtest.h>

#include "../../xmp/src/files/PacketEditor.h"

namespace {

using ovraxmp::detail::Fragment;
using ovraxmp::detail::PacketEditor;

const char kRDF[] = "http://www.w3.org/1999/02/22-rdf-syntax-ns#";
const char kXMP[] = "http://ns.adobe.com/xap/1.0/";

std::string Packet(const std::string& description) {
  return "<?xpacket begin=\"\" id=\"W5M0MpCehiHzreSzNTczkc9d\"?><x:xmpmeta xmlns:x=\"adobe:ns:meta/\">"
         "<rdf:RDF xmlns:rdf=\"" + std::string(kRDF) + "\">" + description +
         "</rdf:RDF></x:xmpmeta>\n" + std::string(200, ' ') + "\n<?xpacket end=\"w\"?>";
}

Fragment Label(const std::string& value) { return {"<xmp:Label>" + value + "</xmp:Label>", {{"xmp", kXMP}, {"rdf", kRDF}}}; }

TEST(PacketEditor, ADescriptionWrittenAsOneEmptyTagIsOpened) {
  PacketEditor editor;
  ASSERT_TRUE(editor.Load(Packet("<rdf:Description rdf:about=\"\"/>"), nullptr));
  editor.Put(kXMP, "Label", Label("Blue"));
  const auto text = editor.Render(std::nullopt);
  ASSERT_TRUE(text);
  EXPECT_NE(text->find("<rdf:Description rdf:about=\"\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\">\n "
                       "<xmp:Label>Blue</xmp:Label>\n</rdf:Description>"),
            std::string::npos)
      << *text;
}

TEST(PacketEditor, APrefixBoundToAnotherNamespaceIsDeclaredOnTheProperty) {
  PacketEditor editor;
  ASSERT_TRUE(editor.Load(Packet("<rdf:Description xmlns:xmp=\"http://example.org/other/\" xmp:Mine=\"1\"/>"), nullptr));
  editor.Put(kXMP, "Label", Label("Blue"));
  const auto text = editor.Render(std::nullopt);
  ASSERT_TRUE(text);
  EXPECT_NE(text->find("xmp:Mine=\"1\""), std::string::npos);
  EXPECT_NE(text->find("<xmp:Label xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\">Blue</xmp:Label>"), std::string::npos)
      << *text;
}

TEST(PacketEditor, ThePaddingAbsorbsTheEditUpToThePacketsLength) {
  PacketEditor editor;
  const std::string packet = Packet("<rdf:Description xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\"/>");
  ASSERT_TRUE(editor.Load(packet, nullptr));
  editor.Put(kXMP, "Label", Label("Blue"));
  const auto same = editor.Render(packet.size());
  ASSERT_TRUE(same);
  EXPECT_EQ(same->size(), packet.size());
  EXPECT_EQ(same->substr(same->size() - 20), "\n<?xpacket end=\"w\"?>");
  editor.Put(kXMP, "Label", Label(std::string(300, 'x')));
  EXPECT_FALSE(editor.Render(packet.size()));
  EXPECT_EQ(editor.Render(std::nullopt, 0)->find(std::string(20, ' ')), std::string::npos);
}

TEST(PacketEditor, PacketsEditsCannotFollowAreMarked) {
  PacketEditor editor;
  // A typed node instead of rdf:Description.
  ASSERT_TRUE(editor.Load(Packet("<xmp:Thing xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\" rdf:about=\"\"/>"), nullptr));
  EXPECT_FALSE(editor.Editable());
  // UTF-16.
  const std::string narrow = Packet("<rdf:Description rdf:about=\"\"/>");
  std::string wide = "\xFF\xFE";
  for (char c : narrow) wide += std::string(1, c) + '\0';
  ASSERT_TRUE(editor.Load(wide, nullptr));
  EXPECT_FALSE(editor.Editable());
}

}  // namespace
