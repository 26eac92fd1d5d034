// Reading a file trusts packets of the plain shapes without parsing them a
// second time: every packet taken as plain must be one the toolkit parses
// whole, and a file answers as it did when every packet was parsed twice.
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "../../xmp/src/XMPScan.h"
#include "HostileInputs.h"
#include "XMPMediaFiles.h"
#include "XMPTestUtil.h"

namespace {

using namespace ovraxmp;

bool Parses(const std::string& packet) {
  try {
    XMPMeta meta;
    meta.ParseFromBuffer(packet);
    return true;
  } catch (const XMP_Error&) {
    return false;
  }
}

bool Plain(const std::string& packet) { return detail::PacketIsPlainRDF(packet.data(), packet.size()); }

const char kRdf[] = "xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\"";

std::string Meta(const std::string& descriptions) {
  return std::string("<x:xmpmeta xmlns:x=\"adobe:ns:meta/\" x:xmptk=\"t\"><rdf:RDF ") + kRdf + ">" + descriptions +
         "</rdf:RDF></x:xmpmeta>";
}

// The shapes writers produce.
const std::vector<std::string> kPlain = {
    hostile::Wrapped(hostile::Packet("<dc:format>image/jpeg</dc:format>")),
    hostile::Packet("<dc:title><rdf:Alt><rdf:li xml:lang=\"x-default\">Harbour &amp; &#x41;</rdf:li>"
                    "<rdf:li xml:lang=\"de\">Hafen</rdf:li></rdf:Alt></dc:title>"
                    "<dc:subject><rdf:Bag><rdf:li>boats</rdf:li><rdf:li/></rdf:Bag></dc:subject>"
                    "<dc:creator>\n <rdf:Seq>\n  <rdf:li>A</rdf:li>\n </rdf:Seq>\n</dc:creator>"),
    Meta("<rdf:Description rdf:about=\"\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\" xmp:Rating=\"3\" "
         "xmp:Label=\"Selected\"/>"
         "<rdf:Description rdf:about=\"\" xmlns:exif=\"http://ns.adobe.com/exif/1.0/\">"
         "<exif:Flash rdf:parseType=\"Resource\"><exif:Fired>False</exif:Fired></exif:Flash>"
         "<exif:ISOSpeedRatings><rdf:Seq><rdf:li>100</rdf:li></rdf:Seq></exif:ISOSpeedRatings>"
         "</rdf:Description>"),
    Meta("<rdf:Description rdf:about=\"\" xmlns:xmpDM=\"http://ns.adobe.com/xmp/1.0/DynamicMedia/\" "
         "xmlns:xmpMM=\"http://ns.adobe.com/xap/1.0/mm/\" xmlns:stRef=\"http://ns.adobe.com/xap/1.0/sType/ResourceRef#\">"
         "<xmpDM:markers><rdf:Seq><rdf:li><rdf:Description xmpDM:name=\"a\"><xmpDM:comment>c</xmpDM:comment>"
         "</rdf:Description></rdf:li></rdf:Seq></xmpDM:markers>"
         "<xmpMM:DerivedFrom rdf:parseType=\"Resource\"><stRef:instanceID>x</stRef:instanceID></xmpMM:DerivedFrom>"
         "<xmpDM:tracks rdf:resource=\"http://example.com/t\"/>"
         "</rdf:Description>"),
};

// Shapes the toolkit may drop part of, or refuse: only its own parse tells.
const std::vector<std::string> kLeftToTheToolkit = {
    hostile::Packet("<rdf:li>misplaced</rdf:li>"),
    hostile::Packet("<dc:format>kept</dc:format><dc:title><rdf:Bag><rdf:Alt/></rdf:Bag></dc:title>"),
    hostile::Packet("<dc:format>a</dc:format><dc:format>b</dc:format>"),
    Meta("<rdf:Description rdf:about=\"\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\" dc:format=\"a\"/>"
         "<rdf:Description rdf:about=\"\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\"><dc:format>b</dc:format>"
         "</rdf:Description>"),
    Meta("<rdf:Description rdf:about=\"a\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\" dc:format=\"a\"/>"
         "<rdf:Description rdf:about=\"b\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\" xmp:Rating=\"1\"/>"),
    hostile::Packet("<dc:title><rdf:Alt><rdf:li xml:lang=\"x-default\">a</rdf:li></rdf:Alt></dc:title>"
                    "<xmp:Title><rdf:Alt><rdf:li xml:lang=\"x-default\">b</rdf:li></rdf:Alt></xmp:Title>"),
    hostile::Packet("<dc:format rdf:parseType=\"Literal\"><b>x</b></dc:format>"),
    hostile::Packet("<dc:format rdf:parseType=\"Resource\"><rdf:value>v</rdf:value><xmp:q>1</xmp:q></dc:format>"),
    hostile::Packet("<dc:format>text<rdf:Bag/></dc:format>"),
    hostile::Packet("<dc:subject xml:lang=\"en\"><rdf:Bag><rdf:li>a</rdf:li></rdf:Bag></dc:subject>"),
    hostile::Packet("<dc:format rdf:ID=\"n\">a</dc:format>"),
    hostile::Packet("<dc:format>a</dc:format><!-- note -->"),
    hostile::Packet("<dc:format><![CDATA[a]]></dc:format>"),
    hostile::Packet("<dc:format>&nbsp;</dc:format>"),
    hostile::Packet("<zz:format>unbound</zz:format>"),
    hostile::Packet("<dc:format>a</dc:format><dc:type rdf:resource=\"r\">text</dc:type>"),
    hostile::Packet("<dc:Thing><xmp:Other>typed</xmp:Other></dc:Thing>"),
};

TEST(XMPPlainPacket, WriterShapesAreTakenAsPlainAndTheToolkitParsesThem) {
  for (const std::string& packet : kPlain) {
    EXPECT_TRUE(Plain(packet)) << packet;
    EXPECT_TRUE(Parses(packet)) << packet;
  }
}

TEST(XMPPlainPacket, FilesAnswerAsTheToolkitsOwnParseDecides) {
  ovratest::TempDir dir;
  int n = 0;
  testing::internal::CaptureStderr();  // the toolkit names what it drops
  for (const auto* list : {&kPlain, &kLeftToTheToolkit}) {
    for (const std::string& packet : *list) {
      const bool parses = Parses(packet);
      if (list == &kLeftToTheToolkit) {
        EXPECT_FALSE(Plain(packet)) << packet;
      }
      const std::string path = (dir / ("p" + std::to_string(++n) + ".jpg")).string();
      ovratest::WriteFile(path, hostile::JpegWithPacket(xmptest::media::Jpeg(), hostile::Wrapped(packet)));
      XMPFiles file(path, kXMP_UnknownFile, kXMPFiles_OpenForRead);
      XMPMeta meta;
      EXPECT_EQ(file.GetXMP(&meta), parses) << packet;
    }
  }
  testing::internal::GetCapturedStderr();
}

TEST(XMPPlainPacket, DamagedPlainPacketsAreTakenAsPlainOnlyWhenTheyParse) {
  // Cuts, doubled pieces and swapped bytes of plain packets: whatever the
  // check accepts, the toolkit must parse whole.
  std::mt19937 random(20240521);
  int accepted = 0;
  testing::internal::CaptureStderr();
  for (int round = 0; round < 4000; ++round) {
    std::string packet = kPlain[static_cast<std::size_t>(round) % kPlain.size()];
    for (int edits = 1 + round % 3; edits > 0; --edits) {
      const std::size_t at = random() % packet.size();
      const std::size_t length = 1 + random() % 24;
      switch (random() % 4) {
        case 0:
          packet.erase(at, length);
          break;
        case 1:
          packet.insert(at, packet.substr(random() % packet.size(), length));
          break;
        case 2:
          packet[at] = "<>/=\"&;: abrdfli"[random() % 16];
          break;
        default:
          std::swap(packet[at], packet[random() % packet.size()]);
          break;
      }
      if (packet.empty()) packet = "x";
    }
    if (!Plain(packet)) continue;
    ++accepted;
    EXPECT_TRUE(Parses(packet)) << packet;
  }
  testing::internal::GetCapturedStderr();
  EXPECT_GT(accepted, 100);  // the damage does not simply make everything doubtful
}

}  // namespace
