// History events written before a save.
#include <string>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;
using xmptest::Get;

TEST(XMPDocOps, SaveAppendsASavedEventAndSetsIds) {
  XMPMeta meta;
  XMPDocOps ops;
  ops.OpenXMP(meta, "");
  EXPECT_FALSE(ops.PrepareForSave(""));  // nothing noted, nothing written
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_XMP_MM, "History"));

  ops.NoteChange("/metadata/dc/title");
  ops.NoteChange(std::vector<std::string>{"/metadata", "/metadata/dc/title"});
  EXPECT_TRUE(ops.PrepareForSave(""));
  ASSERT_EQ(meta.CountArrayItems(kXMP_NS_XMP_MM, "History"), 1);
  EXPECT_TRUE(xmptest::OptionsOf(meta, kXMP_NS_XMP_MM, "History") & kXMP_PropArrayIsOrdered);
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "History[1]/stEvt:action"), "saved");
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "History[1]/stEvt:changed"), "/metadata/dc/title;/metadata");
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "History[1]/stEvt:softwareAgent"), "ovraxmp tests");
  const std::string iid = Get(meta, kXMP_NS_XMP_MM, "History[1]/stEvt:instanceID");
  EXPECT_EQ(iid.rfind("xmp.iid:", 0), 0u);
  EXPECT_EQ(iid.size(), 8u + 36u);
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "InstanceID"), iid);
  const std::string did = Get(meta, kXMP_NS_XMP_MM, "DocumentID");
  EXPECT_EQ(did.rfind("xmp.did:", 0), 0u);
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "OriginalDocumentID"), did);
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "History[1]/stEvt:when"), Get(meta, kXMP_NS_XMP, "MetadataDate"));

  // A second save adds a second event with a new instance id, same document.
  ops.NoteChange("/metadata/xmp/Rating");
  EXPECT_TRUE(ops.PrepareForSave("image/jpeg"));
  ASSERT_EQ(meta.CountArrayItems(kXMP_NS_XMP_MM, "History"), 2);
  EXPECT_NE(Get(meta, kXMP_NS_XMP_MM, "InstanceID"), iid);
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "DocumentID"), did);
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "History[2]/stEvt:changed"), "/metadata/xmp/Rating");
  EXPECT_EQ(Get(meta, kXMP_NS_DC, "format"), "image/jpeg");
}

TEST(XMPDocOps, ExistingDocumentIdIsKeptAndDetachedSaveThrows) {
  XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
  XMPDocOps ops;
  ops.OpenXMP(meta, "video/mp4");
  ops.NoteChange("/metadata");
  ops.PrepareForSave("");
  EXPECT_EQ(Get(meta, kXMP_NS_XMP_MM, "DocumentID"), "xmp.did:0b1d0a6e-52b1-4c4e-9d7a-6a1f1c2d3e4f");
  EXPECT_FALSE(meta.DoesPropertyExist(kXMP_NS_XMP_MM, "OriginalDocumentID"));
  EXPECT_EQ(meta.CountArrayItems(kXMP_NS_XMP_MM, "History"), 2);
  EXPECT_EQ(Get(meta, kXMP_NS_DC, "format"), "video/mp4");
  XMPDocOps detached;
  detached.NoteChange("/metadata");
  EXPECT_THROW(detached.PrepareForSave(""), XMP_Error);
}
