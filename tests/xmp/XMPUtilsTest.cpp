// Path composition, array text, templates, appending, copies and removal.
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;
using xmptest::Get;
using xmptest::kTestNS;

namespace {

class XMPUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override { xmptest::RegisterTestNamespace(); }
};

std::vector<std::string> Items(const XMPMeta& meta, const std::string& ns, const std::string& array) {
  std::vector<std::string> items;
  const XMP_Index count = meta.CountArrayItems(ns, array);
  for (XMP_Index i = 1; i <= count; ++i) {
    items.push_back(meta.GetArrayItem(ns, array, i).value_or(XMP_Node()).value);
  }
  return items;
}

}  // namespace

TEST_F(XMPUtilsTest, ComposedPathsAreTheToolkitForms) {
  std::string path;
  path = XMPUtils::ComposeArrayItemPath(kXMP_NS_DC, "subject", 3);
  EXPECT_EQ(path, "subject[3]");
  path = XMPUtils::ComposeArrayItemPath(kXMP_NS_DC, "subject", kXMP_ArrayLastItem);
  EXPECT_EQ(path, "subject[last()]");
  path = XMPUtils::ComposeStructFieldPath(kXMP_NS_XMP_MM, "DerivedFrom", kXMP_NS_XMP_ResourceRef, "documentID");
  EXPECT_EQ(path, "DerivedFrom/stRef:documentID");
  path = XMPUtils::ComposeQualifierPath(kXMP_NS_DC, "creator[1]", kTestNS, "role");
  EXPECT_EQ(path, "creator[1]/?ovt:role");
  // The composed paths work in every call.
  XMPMeta meta;
  meta.AppendArrayItem(kXMP_NS_DC, "creator", kXMP_PropArrayIsOrdered, "Ana");
  meta.SetProperty(kXMP_NS_DC, path, "author");
  EXPECT_EQ(Get(meta, kXMP_NS_DC, "creator[last()]/?ovt:role"), "author");
  for (XMP_Index bad : {0, -2}) {
    EXPECT_EQ(xmptest::ErrorIdOf([&] { path = XMPUtils::ComposeArrayItemPath(kXMP_NS_DC, "subject", bad); }), kXMPErr_BadIndex);
  }
  for (auto compose : {+[] { XMPUtils::ComposeStructFieldPath(kXMP_NS_DC, "s", "http://ovra.test/unregistered/", "f"); },
                       +[] { XMPUtils::ComposeQualifierPath(kXMP_NS_DC, "s", "http://ovra.test/unregistered/", "q"); }}) {
    EXPECT_EQ(xmptest::ErrorIdOf(compose), kXMPErr_BadSchema);
  }
}

TEST_F(XMPUtilsTest, CatenateQuotesItemsThatNeedIt) {
  XMPMeta meta;
  for (const char* item : {"plain", "semi;colon", "say \"hi\"", " padded", "comma,here", ""})
    meta.AppendArrayItem(kTestNS, "Bag", kXMP_PropValueIsArray, item);
  std::string text;
  text = XMPUtils::CatenateArrayItems(meta, kTestNS, "Bag", "; ", "\"", 0);
  EXPECT_EQ(text, "plain; \"semi;colon\"; \"say \"\"hi\"\"\"; \" padded\"; comma,here; \"\"");
  text = XMPUtils::CatenateArrayItems(meta, kTestNS, "Bag", ", ", "\"", kXMPUtil_AllowCommas);
  EXPECT_EQ(text, "plain, \"semi;colon\", \"say \"\"hi\"\"\", \" padded\", \"comma,here\", \"\"");
  EXPECT_EQ(XMPUtils::CatenateArrayItems(meta, kTestNS, "Missing", "; ", "\"", 0), "");
  meta.SetLocalizedText(kTestNS, "Alt", "", "x-default", "a");
  EXPECT_THROW(XMPUtils::CatenateArrayItems(meta, kTestNS, "Alt", "; ", "\"", 0), XMP_Error);
}

TEST_F(XMPUtilsTest, SeparateSplitsTrimsHonoursQuotesAndReplacesItems) {
  XMPMeta meta;
  XMPUtils::SeparateArrayItems(&meta, kTestNS, "Seq", kXMP_PropArrayIsOrdered,
                               "  one ;two;\"th;ree\" ; \"a \"\"q\"\"\"; x,y ;; ");
  EXPECT_EQ(Items(meta, kTestNS, "Seq"), (std::vector<std::string>{"one", "two", "th;ree", "a \"q\"", "x,y"}));
  EXPECT_TRUE(xmptest::OptionsOf(meta, kTestNS, "Seq") & kXMP_PropArrayIsOrdered);
  XMPUtils::SeparateArrayItems(&meta, kTestNS, "Seq", kXMPUtil_AllowCommas, "x,y; z");
  EXPECT_EQ(Items(meta, kTestNS, "Seq"), (std::vector<std::string>{"x", "y", "z"}));
  EXPECT_TRUE(xmptest::OptionsOf(meta, kTestNS, "Seq") & kXMP_PropArrayIsOrdered);  // an existing array keeps its form
  XMPUtils::SeparateArrayItems(&meta, kTestNS, "Bag", 0, "b");
  EXPECT_EQ(xmptest::OptionsOf(meta, kTestNS, "Bag") & kXMP_PropArrayFormMask, kXMP_PropValueIsArray);
  XMPUtils::SeparateArrayItems(&meta, kTestNS, "Seq", 0, "");
  EXPECT_EQ(meta.CountArrayItems(kTestNS, "Seq"), 0);
}

TEST_F(XMPUtilsTest, TemplateFlagsEachDoTheirPart) {
  const auto working = [] {
    XMPMeta meta;
    meta.SetProperty(kTestNS, "Shared", "working");
    meta.SetProperty(kTestNS, "OnlyWorking", "w");
    meta.SetProperty(kTestNS, "EmptyInTemplate", "w");
    meta.SetProperty(kXMP_NS_XMP_MM, "InstanceID", "xmp.iid:working");  // internal
    return meta;
  };
  XMPMeta tmpl;
  tmpl.SetProperty(kTestNS, "Shared", "template");
  tmpl.SetProperty(kTestNS, "OnlyTemplate", "t");
  tmpl.SetProperty(kTestNS, "EmptyInTemplate", "");
  tmpl.AppendArrayItem(kTestNS, "List", kXMP_PropArrayIsOrdered, "t1");
  tmpl.SetProperty(kXMP_NS_XMP_MM, "DocumentID", "xmp.did:template");

  XMPMeta none = working();
  XMPUtils::ApplyTemplate(&none, tmpl, 0);
  EXPECT_EQ(xmptest::Serialize(none), xmptest::Serialize(working()));

  XMPMeta cleared = working();
  XMPUtils::ApplyTemplate(&cleared, tmpl, kXMPTemplate_ClearUnnamedProperties);
  EXPECT_FALSE(cleared.DoesPropertyExist(kTestNS, "OnlyWorking"));
  EXPECT_EQ(Get(cleared, kTestNS, "Shared"), "working");
  EXPECT_FALSE(cleared.DoesPropertyExist(kTestNS, "OnlyTemplate"));
  EXPECT_TRUE(cleared.DoesPropertyExist(kXMP_NS_XMP_MM, "InstanceID"));  // internal kept
  XMPMeta clearedAll = working();
  XMPUtils::ApplyTemplate(&clearedAll, tmpl,
                          kXMPTemplate_ClearUnnamedProperties | kXMPTemplate_IncludeInternalProperties);
  EXPECT_FALSE(clearedAll.DoesPropertyExist(kXMP_NS_XMP_MM, "InstanceID"));

  XMPMeta added = working();
  XMPUtils::ApplyTemplate(&added, tmpl, kXMPTemplate_AddNewProperties);
  EXPECT_EQ(Get(added, kTestNS, "OnlyTemplate"), "t");
  EXPECT_EQ(Get(added, kTestNS, "List[1]"), "t1");
  EXPECT_EQ(Get(added, kTestNS, "Shared"), "working");
  EXPECT_FALSE(added.DoesPropertyExist(kXMP_NS_XMP_MM, "DocumentID"));
  XMPUtils::ApplyTemplate(&added, tmpl, kXMPTemplate_AddNewProperties | kXMPTemplate_IncludeInternalProperties);
  EXPECT_EQ(Get(added, kXMP_NS_XMP_MM, "DocumentID"), "xmp.did:template");

  XMPMeta replaced = working();
  XMPUtils::ApplyTemplate(&replaced, tmpl, kXMPTemplate_ReplaceExistingProperties);
  EXPECT_EQ(Get(replaced, kTestNS, "Shared"), "template");
  EXPECT_EQ(Get(replaced, kTestNS, "EmptyInTemplate"), "");
  EXPECT_FALSE(replaced.DoesPropertyExist(kTestNS, "OnlyTemplate"));
  EXPECT_EQ(Get(replaced, kTestNS, "OnlyWorking"), "w");

  XMPMeta deleted = working();
  XMPUtils::ApplyTemplate(&deleted, tmpl, kXMPTemplate_ReplaceWithDeleteEmpty);
  EXPECT_EQ(Get(deleted, kTestNS, "Shared"), "template");
  EXPECT_FALSE(deleted.DoesPropertyExist(kTestNS, "EmptyInTemplate"));
  EXPECT_FALSE(deleted.DoesPropertyExist(kTestNS, "OnlyTemplate"));

  XMPMeta replaceAll = working();  // the "replace all" mapping: clear + replace
  XMPUtils::ApplyTemplate(&replaceAll, tmpl,
                          kXMPTemplate_ClearUnnamedProperties | kXMPTemplate_ReplaceExistingProperties);
  EXPECT_FALSE(replaceAll.DoesPropertyExist(kTestNS, "OnlyWorking"));
  EXPECT_EQ(Get(replaceAll, kTestNS, "Shared"), "template");
}

TEST_F(XMPUtilsTest, AppendPropertiesMergesReplacesAndDeletesEmpty) {
  XMPMeta source = xmptest::Parse(xmptest::RealWorldPacket());
  source.SetProperty(kTestNS, "Empty", "");
  XMPMeta dest;
  dest.SetProperty(kXMP_NS_XMP, "Label", "Mine");
  dest.AppendArrayItem(kXMP_NS_DC, "subject", kXMP_PropValueIsArray, "lake");
  dest.AppendArrayItem(kXMP_NS_DC, "subject", 0, "own");
  dest.SetProperty(kTestNS, "Empty", "present");
  XMPUtils::AppendProperties(source, &dest, 0);
  EXPECT_EQ(Get(dest, kXMP_NS_XMP, "Label"), "Mine");
  EXPECT_EQ(Items(dest, kXMP_NS_DC, "subject"),
            (std::vector<std::string>{"lake", "own", "dusk; blue hour", "\"quoted\""}));
  EXPECT_EQ(Get(dest, kXMP_NS_DC, "creator[2]"), "Bo Chen");
  EXPECT_EQ(Get(dest, kXMP_NS_DM, "shotName"), "Take 7");
  EXPECT_TRUE(dest.DoesPropertyExist(kXMP_NS_DM, "shotName/?xmpDM:good"));
  EXPECT_FALSE(dest.DoesPropertyExist(kXMP_NS_XMP_MM, "History"));  // internal without DoAll
  EXPECT_EQ(Get(dest, kTestNS, "Empty"), "present");

  XMPUtils::AppendProperties(source, &dest,
                             kXMPUtil_DoAllProperties | kXMPUtil_ReplaceOldValues | kXMPUtil_DeleteEmptyValues);
  EXPECT_EQ(Get(dest, kXMP_NS_XMP, "Label"), "Select");
  EXPECT_EQ(dest.CountArrayItems(kXMP_NS_DC, "subject"), 3);
  EXPECT_EQ(Get(dest, kXMP_NS_XMP_MM, "History[1]/stEvt:action"), "created");
  EXPECT_FALSE(dest.DoesPropertyExist(kTestNS, "Empty"));
  ASSERT_TRUE(dest.GetLocalizedText(kXMP_NS_DC, "title", "", "de-CH"));
  EXPECT_EQ(dest.GetLocalizedText(kXMP_NS_DC, "title", "", "de-CH")->value, "See in der Dämmerung");
}

TEST_F(XMPUtilsTest, DuplicateSubtreeCopiesAndRemovePropertiesRemoves) {
  const XMPMeta source = xmptest::Parse(xmptest::RealWorldPacket());
  XMPMeta dest;
  dest.SetStructField(kXMP_NS_XMP_MM, "DerivedFrom", kXMP_NS_XMP_ResourceRef, "filePath", "old");
  XMPUtils::DuplicateSubtree(source, &dest, kXMP_NS_XMP_MM, "DerivedFrom");
  EXPECT_FALSE(dest.DoesPropertyExist(kXMP_NS_XMP_MM, "DerivedFrom/stRef:filePath"));
  EXPECT_EQ(Get(dest, kXMP_NS_XMP_MM, "DerivedFrom/stRef:documentID"), "xmp.did:66666666-7777-8888-9999-000000000000");
  XMPUtils::DuplicateSubtree(source, &dest, kXMP_NS_DC, "dc:creator", kTestNS, "Authors");
  EXPECT_EQ(Items(dest, kTestNS, "Authors"), (std::vector<std::string>{"Ana Müller", "Bo Chen"}));
  XMPUtils::DuplicateSubtree(source, &dest, kXMP_NS_DC, "");
  EXPECT_EQ(dest.CountArrayItems(kXMP_NS_DC, "subject"), 3);
  EXPECT_EQ(xmptest::ErrorIdOf([&] { XMPUtils::DuplicateSubtree(source, &dest, kXMP_NS_DC, "missing"); }), kXMPErr_BadXPath);

  XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
  XMPUtils::RemoveProperties(&meta, kXMP_NS_XMP, "Label");
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_XMP, "Label"));
  XMPUtils::RemoveProperties(&meta, kXMP_NS_DC);
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_DC, "title"));
  EXPECT_TRUE(meta.DoesPropertyExist(kXMP_NS_XMP, "Rating"));
  XMPUtils::RemoveProperties(&meta);
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_XMP, "Rating"));
  EXPECT_TRUE(meta.DoesPropertyExist(kXMP_NS_XMP_MM, "DocumentID"));  // internal
  XMPUtils::RemoveProperties(&meta, "", "", kXMPUtil_DoAllProperties);
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_XMP_MM, "DocumentID"));
}
