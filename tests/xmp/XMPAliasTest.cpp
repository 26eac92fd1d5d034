// Properties that the toolkit keeps under another name (tiff:ImageDescription
// is dc:description, tiff:Artist the first dc:creator, ...): reads and
// writes through the alias reach the actual property, quietly.
#include <string>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;

namespace {

const char kPhotoshop[] = "http://ns.adobe.com/photoshop/1.0/";

XMPMeta Described() {
  return xmptest::Parse(
      "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
      "<rdf:Description rdf:about=\"\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\">"
      "<dc:description><rdf:Alt><rdf:li xml:lang=\"x-default\">A harbour at dusk</rdf:li>"
      "</rdf:Alt></dc:description>"
      "<dc:rights><rdf:Alt><rdf:li xml:lang=\"x-default\">(c) Ana</rdf:li></rdf:Alt></dc:rights>"
      "<dc:creator><rdf:Seq><rdf:li>Ana</rdf:li><rdf:li>Ben</rdf:li></rdf:Seq></dc:creator>"
      "<dc:subject><rdf:Bag><rdf:li>sea</rdf:li><rdf:li>boat</rdf:li><rdf:li>dusk</rdf:li></rdf:Bag></dc:subject>"
      "</rdf:Description></rdf:RDF></x:xmpmeta>");
}

TEST(XMPAliases, ReadsThroughAnAliasReachTheActualProperty) {
  const XMPMeta meta = Described();
  const auto alt = [&](const char* name, std::string* lang = nullptr) {
    const auto chosen = meta.GetLocalizedText(kXMP_NS_TIFF, name, "", "x-default");
    if (chosen && lang) *lang = chosen->language;
    return chosen ? chosen->value : "<absent>";
  };
  testing::internal::CaptureStderr();
  std::string lang;
  EXPECT_EQ(alt("ImageDescription", &lang), "A harbour at dusk");
  EXPECT_EQ(lang, "x-default");
  EXPECT_EQ(alt("tiff:ImageDescription"), "A harbour at dusk");
  EXPECT_EQ(alt("Copyright"), "(c) Ana");
  EXPECT_EQ(meta.CountArrayItems(kPhotoshop, "Keywords"), 3);
  EXPECT_EQ(meta.GetArrayItem(kPhotoshop, "Keywords", 2).value_or(XMP_Node()).value, "boat");
  EXPECT_EQ(xmptest::Get(meta, kXMP_NS_TIFF, "Artist"), "Ana");
  EXPECT_EQ(xmptest::Get(meta, kXMP_NS_TIFF, "ImageDescription[1]"), "A harbour at dusk");
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

TEST(XMPAliases, WritesThroughAnAliasChangeTheActualProperty) {
  XMPMeta meta = Described();
  meta.SetLocalizedText(kXMP_NS_TIFF, "ImageDescription", "", "x-default", "Boats");
  meta.AppendArrayItem(kPhotoshop, "Keywords", kXMP_PropValueIsArray, "net");
  meta.DeleteLocalizedText(kXMP_NS_TIFF, "Copyright", "", "x-default");
  ASSERT_TRUE(meta.GetLocalizedText(kXMP_NS_DC, "description", "", "x-default"));
  EXPECT_EQ(meta.GetLocalizedText(kXMP_NS_DC, "description", "", "x-default")->value, "Boats");
  EXPECT_EQ(meta.CountArrayItems(kXMP_NS_DC, "subject"), 4);
  EXPECT_FALSE(meta.GetLocalizedText(kXMP_NS_DC, "rights", "", "x-default"));
  // Without the actual property, the alias reads as absent.
  const XMPMeta empty;
  EXPECT_FALSE(empty.GetLocalizedText(kXMP_NS_TIFF, "ImageDescription", "", "x-default"));
  EXPECT_EQ(empty.CountArrayItems(kPhotoshop, "Keywords"), 0);
}

}  // namespace
