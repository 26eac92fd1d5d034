// Parsing, serialising and the property operations of XMPMeta.
#include <string>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;
using xmptest::Get;
using xmptest::kTestNS;

namespace {

class XMPProperties : public ::testing::Test {
 protected:
  void SetUp() override { xmptest::RegisterTestNamespace(); }
};

}  // namespace

TEST_F(XMPProperties, RealWorldPacketSurvivesSerialiseAndReparse) {
  const XMPMeta original = xmptest::Parse(xmptest::RealWorldPacket());
  for (const std::string& text : {xmptest::Serialize(original), [&] {
         std::string compact;
         compact = original.SerializeToBuffer(kXMP_UseCompactFormat | kXMP_OmitPacketWrapper);
         return compact;
       }()}) {
    const XMPMeta again = xmptest::Parse(text);
    EXPECT_EQ(Get(again, kXMP_NS_XMP, "Rating"), "4");
    EXPECT_EQ(Get(again, kXMP_NS_Photoshop, "City"), "Zürich");
    EXPECT_EQ(again.CountArrayItems(kXMP_NS_DC, "creator"), 2);
    EXPECT_EQ(Get(again, kXMP_NS_DC, "creator[2]"), "Bo Chen");
    EXPECT_EQ(Get(again, kXMP_NS_DC, "subject[2]"), "dusk; blue hour");
    EXPECT_EQ(Get(again, kXMP_NS_DC, "subject[3]"), "\"quoted\"");
    const auto title = again.GetLocalizedText(kXMP_NS_DC, "title", "fr", "fr-CH");
    ASSERT_TRUE(title);
    EXPECT_EQ(title->language, "fr-CH");
    EXPECT_EQ(title->value, "Lac au crépuscule");
    const auto field = again.GetStructField(kXMP_NS_XMP_MM, "DerivedFrom", kXMP_NS_XMP_ResourceRef, "documentID");
    ASSERT_TRUE(field);
    EXPECT_EQ(field->value, "xmp.did:66666666-7777-8888-9999-000000000000");
    EXPECT_EQ(Get(again, kXMP_NS_XMP_MM, "History[1]/stEvt:action"), "created");
    EXPECT_EQ(Get(again, kXMP_NS_DM, "shotName/?xmpDM:good"), "True");
    EXPECT_EQ(Get(again, kXMP_NS_DM, "shotName"), "Take 7");
  }
}

TEST_F(XMPProperties, ParseAcceptsBareRdfAndEmptyAndRejectsMalformed) {
  const std::string bare =
      "<?xml version=\"1.0\"?><rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
      "<rdf:Description rdf:about=\"\" xmlns:xmp=\"http://ns.adobe.com/xap/1.0/\" xmp:Label=\"bare\"/></rdf:RDF>";
  EXPECT_EQ(Get(xmptest::Parse(bare), kXMP_NS_XMP, "Label"), "bare");
  XMPMeta meta;
  meta.SetProperty(kTestNS, "Old", "x");
  meta.SetMultiValued(kTestNS, "Old");
  meta.ParseFromBuffer(std::string());
  EXPECT_FALSE(meta.DoesPropertyExist(kTestNS, "Old"));
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "Old"));
  // Trailing NUL padding is tolerated.
  const std::string packet = xmptest::RealWorldPacket();
  EXPECT_EQ(Get(xmptest::Parse(packet + std::string(16, '\0')), kXMP_NS_XMP, "Label"), "Select");
  // Malformed text is refused quietly and leaves the packet as it was
  // (hostile packets: XMPFilesTest.cpp).
  for (const std::string& bad : {std::string("<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF"),
                                 std::string("\x01\x02 not xml at all <<<")}) {
    XMPMeta target;
    target.SetProperty(kTestNS, "Kept", "yes");
    testing::internal::CaptureStderr();
    // Malformed (BadXML) or refused by the checks (BadXMP).
    const int id = xmptest::ErrorIdOf([&] { target.ParseFromBuffer(bad); });
    EXPECT_TRUE(id == kXMPErr_BadXML || id == kXMPErr_BadXMP) << id;
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    EXPECT_EQ(Get(target, kTestNS, "Kept"), "yes");
  }
}

TEST_F(XMPProperties, SimpleGetSetDeleteExists) {
  XMPMeta meta;
  EXPECT_FALSE(meta.GetProperty(kTestNS, "Name"));
  meta.SetProperty(kTestNS, "Name", "first");
  meta.SetProperty(kTestNS, "ovt:Name", "second");  // prefixed form names the same node
  const auto name = meta.GetProperty(kTestNS, "Name");
  ASSERT_TRUE(name);
  EXPECT_EQ(name->value, "second");
  EXPECT_EQ(name->options & kXMP_PropCompositeMask, 0u);
  EXPECT_TRUE(meta.DoesPropertyExist(kTestNS, "Name"));
  meta.DeleteProperty(kTestNS, "Name");
  meta.DeleteProperty(kTestNS, "Name");
  EXPECT_FALSE(meta.DoesPropertyExist(kTestNS, "Name"));
  // A text value on an array is refused quietly, unless the array goes.
  meta.AppendArrayItem(kTestNS, "List", kXMP_PropValueIsArray, "item");
  testing::internal::CaptureStderr();
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.SetProperty(kTestNS, "List", "text"); }), kXMPErr_BadXPath);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  meta.SetProperty(kTestNS, "List", "text", kXMP_DeleteExisting);
  EXPECT_EQ(Get(meta, kTestNS, "List"), "text");
  // Unregistered namespaces: reads answer false, writes raise bad-schema.
  EXPECT_FALSE(meta.GetProperty("http://ovra.test/unregistered/", "X"));
  EXPECT_FALSE(meta.DoesPropertyExist("http://ovra.test/unregistered/", "X"));
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.SetProperty("http://ovra.test/unregistered/", "X", "1"); }), kXMPErr_BadSchema);
}

TEST_F(XMPProperties, TypedValuesUseTheTextForms) {
  XMPMeta meta;
  meta.SetProperty_Bool(kTestNS, "B", true);
  meta.SetProperty_Int(kTestNS, "I", -42);
  meta.SetProperty_Int64(kTestNS, "L", -1234567890123LL);
  meta.SetProperty_Float(kTestNS, "F", 2.5);
  XMP_DateTime date;
  date = XMPUtils::ConvertToDate("2024-03-05T07:08:09.25+02:00");
  meta.SetProperty_Date(kTestNS, "D", date);
  EXPECT_EQ(Get(meta, kTestNS, "B"), "True");
  EXPECT_EQ(Get(meta, kTestNS, "I"), "-42");
  EXPECT_EQ(Get(meta, kTestNS, "L"), "-1234567890123");
  EXPECT_EQ(Get(meta, kTestNS, "F"), "2.500000");
  EXPECT_EQ(Get(meta, kTestNS, "D"), "2024-03-05T07:08:09.25+02:00");
  EXPECT_EQ(meta.GetProperty_Bool(kTestNS, "B"), std::optional<bool>(true));
  EXPECT_EQ(meta.GetProperty_Int(kTestNS, "I"), std::optional<std::int32_t>(-42));
  EXPECT_EQ(meta.GetProperty_Int64(kTestNS, "L"), std::optional<std::int64_t>(-1234567890123LL));
  EXPECT_EQ(meta.GetProperty_Float(kTestNS, "F"), std::optional<double>(2.5));
  EXPECT_FALSE(meta.GetProperty_Int(kTestNS, "Missing"));
  EXPECT_THROW(meta.GetProperty_Int(kTestNS, "L"), XMP_Error);  // out of 32-bit range
  meta.SetProperty(kTestNS, "Text", "abc");
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.GetProperty_Float(kTestNS, "Text"); }), kXMPErr_BadValue);
}

TEST_F(XMPProperties, ArraysAppendInsertCountAndDelete) {
  XMPMeta meta;
  EXPECT_EQ(meta.CountArrayItems(kTestNS, "List"), 0);
  EXPECT_THROW(meta.AppendArrayItem(kTestNS, "List", 0, "x"), XMP_Error);  // no form for a new array
  meta.AppendArrayItem(kTestNS, "List", kXMP_PropArrayIsOrdered, "b");
  meta.AppendArrayItem(kTestNS, "List", 0, "d");
  meta.SetArrayItem(kTestNS, "List", 1, "a", kXMP_InsertBeforeItem);
  meta.SetArrayItem(kTestNS, "List", 2, "c", kXMP_InsertAfterItem);
  meta.SetArrayItem(kTestNS, "List", kXMP_ArrayLastItem, "c2", kXMP_InsertBeforeItem);
  meta.SetArrayItem(kTestNS, "List", 6, "e");  // count + 1 appends
  // a b c c2 d e
  ASSERT_EQ(meta.CountArrayItems(kTestNS, "List"), 6);
  const char* expected[] = {"a", "b", "c", "c2", "d", "e"};
  const auto item = [&](XMP_Index i) { return meta.GetArrayItem(kTestNS, "List", i).value_or(XMP_Node{"<absent>"}).value; };
  for (int i = 1; i <= 6; ++i) EXPECT_EQ(item(i), expected[i - 1]);
  EXPECT_EQ(item(kXMP_ArrayLastItem), "e");
  EXPECT_EQ(xmptest::OptionsOf(meta, kTestNS, "List") & kXMP_PropArrayFormMask,
            kXMP_PropValueIsArray | kXMP_PropArrayIsOrdered);
  EXPECT_FALSE(meta.GetArrayItem(kTestNS, "List", 7));
  meta.DeleteArrayItem(kTestNS, "List", 2);
  meta.DeleteArrayItem(kTestNS, "List", kXMP_ArrayLastItem);
  EXPECT_EQ(meta.CountArrayItems(kTestNS, "List"), 4);
  EXPECT_EQ(Get(meta, kTestNS, "List[2]"), "c");
  // Errors: bad index, item beyond the end, a simple property used as array.
  for (XMP_Index bad : {0, -2})
    EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.GetArrayItem(kTestNS, "List", bad); }), kXMPErr_BadIndex);
  EXPECT_THROW(meta.SetArrayItem(kTestNS, "List", 9, "z"), XMP_Error);
  meta.SetProperty(kTestNS, "Simple", "s");
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.CountArrayItems(kTestNS, "Simple"); }), kXMPErr_BadXPath);
}

TEST_F(XMPProperties, StructureItemsCanBeInsertedAnywhere) {
  XMPMeta meta;
  meta.AppendArrayItem(kTestNS, "People", kXMP_PropArrayIsOrdered, "", kXMP_PropValueIsStruct);
  meta.SetStructField(kTestNS, "People[1]", kTestNS, "Name", "second");
  meta.SetArrayItem(kTestNS, "People", 1, "", kXMP_PropValueIsStruct | kXMP_InsertBeforeItem);
  meta.SetStructField(kTestNS, "People[1]", kTestNS, "Name", "first");
  meta.SetArrayItem(kTestNS, "People", kXMP_ArrayLastItem, "", kXMP_PropValueIsStruct | kXMP_InsertAfterItem);
  meta.SetStructField(kTestNS, "People[3]", kTestNS, "Name", "third");
  ASSERT_EQ(meta.CountArrayItems(kTestNS, "People"), 3);
  EXPECT_EQ(Get(meta, kTestNS, "People[1]/ovt:Name"), "first");
  EXPECT_EQ(Get(meta, kTestNS, "People[2]/ovt:Name"), "second");
  EXPECT_EQ(Get(meta, kTestNS, "People[3]/ovt:Name"), "third");
  EXPECT_TRUE(meta.GetArrayItem(kTestNS, "People", 3)->options & kXMP_PropValueIsStruct);
  EXPECT_THROW(meta.SetArrayItem(kTestNS, "People", 1, "text", kXMP_PropValueIsStruct), XMP_Error);
}

TEST_F(XMPProperties, StructFieldsAndQualifiers) {
  XMPMeta meta;
  meta.SetStructField(kTestNS, "Place", kXMP_NS_DC, "title", "Harbour");
  meta.SetStructField(kTestNS, "Place", kTestNS, "Code", "42");
  EXPECT_TRUE(xmptest::OptionsOf(meta, kTestNS, "Place") & kXMP_PropValueIsStruct);
  EXPECT_EQ(meta.GetStructField(kTestNS, "Place", kXMP_NS_DC, "title").value_or(XMP_Node()).value, "Harbour");
  EXPECT_EQ(Get(meta, kTestNS, "Place/ovt:Code"), "42");
  EXPECT_FALSE(meta.GetStructField(kTestNS, "NoStruct", kXMP_NS_DC, "title"));
  meta.SetProperty(kTestNS, "Plain", "p");
  EXPECT_THROW(meta.GetStructField(kTestNS, "Plain", kXMP_NS_DC, "title"), XMP_Error);
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.SetStructField(kTestNS, "Place", "http://ovra.test/unregistered/", "F", "v"); }), kXMPErr_BadSchema);

  meta.SetProperty(kTestNS, "Plain/?ovt:Unit", "mm");
  const auto unit = meta.GetProperty(kTestNS, "Plain/?ovt:Unit");
  ASSERT_TRUE(unit);
  EXPECT_EQ(unit->value, "mm");
  EXPECT_TRUE(unit->options & kXMP_PropIsQualifier);
  EXPECT_EQ(Get(meta, kTestNS, "Plain"), "p");
}

TEST_F(XMPProperties, LocalizedTextFollowsXDefaultRules) {
  XMPMeta meta;
  const auto chosen = [&](const char* generic, const char* specific) {
    return meta.GetLocalizedText(kXMP_NS_DC, "rights", generic, specific).value_or(XMP_LocalizedNode());
  };
  EXPECT_FALSE(meta.GetLocalizedText(kXMP_NS_DC, "rights", "", "x-default"));
  meta.SetLocalizedText(kXMP_NS_DC, "rights", "", "x-default", "All rights reserved");
  meta.SetLocalizedText(kXMP_NS_DC, "rights", "de", "de-DE", "Alle Rechte vorbehalten");
  meta.SetLocalizedText(kXMP_NS_DC, "rights", "fr", "fr-FR", "Tous droits réservés");
  EXPECT_TRUE(xmptest::OptionsOf(meta, kXMP_NS_DC, "rights") & kXMP_PropArrayIsAltText);
  // Specific match, generic match, then x-default.
  EXPECT_EQ(chosen("de", "de-DE").language, "de-DE");
  EXPECT_EQ(chosen("fr", "fr-CA").value, "Tous droits réservés");
  EXPECT_EQ(chosen("", "it-IT").language, "x-default");
  meta.DeleteLocalizedText(kXMP_NS_DC, "rights", "fr", "fr-FR");
  EXPECT_EQ(chosen("", "fr-FR").language, "x-default");
  meta.AppendArrayItem(kTestNS, "Seq", kXMP_PropArrayIsOrdered, "x");
  EXPECT_THROW(meta.GetLocalizedText(kTestNS, "Seq", "", "x-default"), XMP_Error);
}

TEST_F(XMPProperties, CloneIsDeepAndEraseKeepsTheHandle) {
  XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
  meta.SetMultiValued(kXMP_NS_XMP, "Rating");
  XMPMeta copy = meta.Clone();
  EXPECT_NE(copy.GetInternalRef(), meta.GetInternalRef());
  copy.SetProperty(kXMP_NS_XMP, "Label", "Changed");
  EXPECT_EQ(Get(meta, kXMP_NS_XMP, "Label"), "Select");
  EXPECT_TRUE(copy.IsMultiValued(kXMP_NS_XMP, "Rating"));
  const XMPMetaRef before = meta.GetInternalRef();
  meta.Erase();
  EXPECT_EQ(meta.GetInternalRef(), before);
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_XMP, "Rating"));
  EXPECT_FALSE(meta.IsMultiValued(kXMP_NS_XMP, "Rating"));
  EXPECT_EQ(Get(copy, kXMP_NS_XMP, "Rating"), "4");
}

TEST_F(XMPProperties, TransientNamespaceIsNeverSerialised) {
  XMPMeta meta;
  meta.SetProperty(kXMP_NS_XMP, "Label", "kept");
  meta.SetProperty(kXMP_NS_Transient, "MultiFileCount", "3");
  const std::string text = xmptest::Serialize(meta);
  EXPECT_EQ(text.find("transient"), std::string::npos) << text;
  EXPECT_EQ(text.find("MultiFileCount"), std::string::npos);
  EXPECT_NE(text.find("kept"), std::string::npos);
  EXPECT_EQ(Get(meta, kXMP_NS_Transient, "MultiFileCount"), "3");  // still in memory
}

TEST_F(XMPProperties, MultiValueMarksCoverDescendantsAndClearBelow) {
  XMPMeta meta;
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "Place"));
  meta.SetMultiValued(kTestNS, "ovt:Place");
  meta.SetMultiValued(kTestNS, "List[2]");
  meta.SetMultiValued(kTestNS, "Placement");
  EXPECT_TRUE(meta.IsMultiValued(kTestNS, "Place"));
  EXPECT_TRUE(meta.IsMultiValued(kTestNS, "Place/ovt:Code"));
  EXPECT_TRUE(meta.IsMultiValued(kTestNS, "Place/ovt:Inner/dc:title[1]"));
  EXPECT_TRUE(meta.IsMultiValued(kTestNS, "List[2]/?ovt:Q"));
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "List[1]"));
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "List"));
  EXPECT_FALSE(meta.IsMultiValued(kXMP_NS_DC, "Place"));
  meta.ClearMultiValueInfo(kTestNS, "Place");
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "Place/ovt:Code"));
  EXPECT_TRUE(meta.IsMultiValued(kTestNS, "Placement"));  // a sibling sharing the prefix stays
  meta.ClearMultiValueInfo(kTestNS, "List");
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "List[2]"));
  meta.ClearMultiValueInfo(kTestNS, "");
  EXPECT_FALSE(meta.IsMultiValued(kTestNS, "Placement"));
}

TEST_F(XMPProperties, PathsIntoNodesOfTheWrongKindFailQuietly) {
  XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
  testing::internal::CaptureStderr();
  // Rating is simple, creator an array, DerivedFrom a structure.
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.GetProperty(kXMP_NS_XMP, "Rating/xmp:Sub"); }), kXMPErr_BadXPath);
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.DoesPropertyExist(kXMP_NS_XMP, "Rating[1]"); }), kXMPErr_BadXPath);
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.DeleteProperty(kXMP_NS_DC, "creator/dc:x"); }), kXMPErr_BadXPath);
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.SetProperty(kXMP_NS_XMP_MM, "DerivedFrom[1]", "v"); }), kXMPErr_BadXPath);
  EXPECT_EQ(xmptest::ErrorIdOf([&] { meta.SetProperty(kXMP_NS_DC, "missing[1]", "v"); }), kXMPErr_BadXPath);
  // Missing ancestors read as absent; a qualifier may sit on any node.
  EXPECT_FALSE(meta.GetProperty(kXMP_NS_XMP, "Missing/xmp:Sub[2]/?xmp:Q"));
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_DC, "creator[7]/?xmp:Q"));
  EXPECT_FALSE(meta.GetProperty(kXMP_NS_XMP, "Rating/?xmp:Q"));
  meta.DeleteProperty(kXMP_NS_XMP, "Missing/xmp:Sub");
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  meta.SetProperty(kXMP_NS_XMP, "NewStruct/xmp:Field", "created");  // implicit structure
  EXPECT_EQ(Get(meta, kXMP_NS_XMP, "NewStruct/xmp:Field"), "created");
}

TEST_F(XMPProperties, OrdinaryOperationsPrintNothingOnStderr) {
  testing::internal::CaptureStderr();
  {
    XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
    meta.GetProperty(kXMP_NS_XMP, "Missing");
    meta.GetProperty("http://ovra.test/unregistered/", "X");
    meta.DoesPropertyExist("http://ovra.test/unregistered/", "X");
    meta.DeleteProperty("http://ovra.test/unregistered/", "X");
    meta.DeleteProperty(kXMP_NS_XMP, "Missing");
    meta.GetArrayItem(kXMP_NS_DC, "missing", 1);
    meta.GetArrayItem(kXMP_NS_DC, "creator", 9);
    meta.CountArrayItems(kXMP_NS_DC, "subject");
    meta.GetStructField(kXMP_NS_XMP_MM, "Missing", kXMP_NS_XMP_ResourceRef, "documentID");
    meta.GetStructField(kXMP_NS_XMP_MM, "DerivedFrom", kXMP_NS_XMP_ResourceRef, "missing");
    meta.GetLocalizedText(kXMP_NS_DC, "missing", "", "x-default");
    meta.GetLocalizedText(kXMP_NS_DC, "title", "", "it-IT");
    meta.SetProperty(kXMP_NS_XMP, "Label", "New");
    meta.SetLocalizedText(kXMP_NS_DC, "title", "", "x-default", "T");
    meta.AppendArrayItem(kXMP_NS_DC, "subject", 0, "more");
    meta.DeleteArrayItem(kXMP_NS_DC, "subject", 1);
    meta.DeleteArrayItem(kXMP_NS_DC, "missing", 1);
    meta.DeleteLocalizedText(kXMP_NS_DC, "title", "", "it-IT");
    XMPIterator all(meta);
    std::string ns, path;
    while (all.Next(&ns, &path)) {
    }
    XMPIterator none(meta, "http://ovra.test/unregistered/");
    none.Next();
    XMPIterator missing(meta, kXMP_NS_DC, "missing");
    missing.Next();
    std::string text;
    text = meta.SerializeToBuffer();
    meta.IsMultiValued(kXMP_NS_DC, "title");
  }
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

// The toolkit gives the other item of a two-item language alternative the
// "x-default" text, when it parses and when it serialises.
TEST_F(XMPProperties, TwoItemLanguageAlternativeKeepsItsOtherText) {
  const std::string packet =
      "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\">"
      "<rdf:Description rdf:about=\"\" xmlns:dc=\"http://purl.org/dc/elements/1.1/\">"
      "<dc:title><rdf:Alt><rdf:li xml:lang=\"de\">Hallo &amp; tsch&#xFC;ss</rdf:li>"
      "<rdf:li xml:lang=\"x-default\">Hello</rdf:li></rdf:Alt></dc:title>"
      "<dc:rights><rdf:Alt><rdf:li xml:lang=\"x-default\">Same</rdf:li><rdf:li xml:lang=\"fr\">Same</rdf:li></rdf:Alt>"
      "</dc:rights></rdf:Description></rdf:RDF></x:xmpmeta>";
  XMPMeta meta = xmptest::Parse(packet);
  const auto expectTexts = [](const XMPMeta& m, const char* when) {
    EXPECT_EQ(Get(m, kXMP_NS_DC, "title[1]"), "Hello") << when;
    EXPECT_EQ(Get(m, kXMP_NS_DC, "title[2]"), "Hallo & tschüss") << when;
    EXPECT_EQ(Get(m, kXMP_NS_DC, "rights[2]"), "Same") << when;
  };
  expectTexts(meta, "parsed");
  expectTexts(meta.Clone(), "cloned");
  std::string exact;
  exact = meta.SerializeToBuffer(kXMP_ExactPacketLength, 4000);
  EXPECT_EQ(exact.size(), 4000u);
  expectTexts(meta, "after serialising");
  expectTexts(xmptest::Parse(exact), "reparsed");
  meta.SetArrayItem(kXMP_NS_DC, "title", 1, "Hi");
  const XMPMeta changed = xmptest::Parse(xmptest::Serialize(meta));
  EXPECT_EQ(Get(changed, kXMP_NS_DC, "title[1]"), "Hi");
  EXPECT_EQ(Get(changed, kXMP_NS_DC, "title[2]"), "Hallo & tschüss");
}
