// Iteration over packets, namespaces and subtrees.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;

namespace {

std::vector<std::string> Walk(XMPIterator& it) {
  std::vector<std::string> seen;
  std::string ns, path, value;
  XMP_OptionBits options = 0;
  while (it.Next(&ns, &path, &value, &options)) seen.push_back((options & kXMP_SchemaNode) ? "schema:" + ns : path);
  return seen;
}

}  // namespace

TEST(XMPIterator, WholePacketNamespaceAndSubtree) {
  const XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
  XMPIterator schemas(meta, kXMP_IterJustChildren);
  const std::vector<std::string> top = Walk(schemas);
  EXPECT_EQ(top.size(), 6u);
  EXPECT_NE(std::find(top.begin(), top.end(), std::string("schema:") + kXMP_NS_DC), top.end());

  XMPIterator dc(meta, kXMP_NS_DC, kXMP_IterJustChildren);
  EXPECT_EQ(Walk(dc), (std::vector<std::string>{"dc:title", "dc:creator", "dc:subject"}));

  XMPIterator creator(meta, kXMP_NS_DC, "creator");
  EXPECT_EQ(Walk(creator), (std::vector<std::string>{"dc:creator", "dc:creator[1]", "dc:creator[2]"}));

  XMPIterator leaves(meta, kXMP_NS_DC, "title", kXMP_IterJustLeafNodes | kXMP_IterOmitQualifiers);
  EXPECT_EQ(Walk(leaves), (std::vector<std::string>{"dc:title[1]", "dc:title[2]", "dc:title[3]"}));

  XMPIterator names(meta, kXMP_NS_XMP_MM, "DerivedFrom", kXMP_IterJustChildren | kXMP_IterJustLeafName);
  EXPECT_EQ(Walk(names), (std::vector<std::string>{"stRef:instanceID", "stRef:documentID"}));

  XMPIterator withQualifiers(meta, kXMP_NS_DM, "shotName");
  EXPECT_EQ(Walk(withQualifiers), (std::vector<std::string>{"xmpDM:shotName", "xmpDM:shotName/?xmpDM:good"}));
}

TEST(XMPIterator, UnknownNamespaceOrMissingPropertyIsEmpty) {
  const XMPMeta meta = xmptest::Parse(xmptest::RealWorldPacket());
  XMPIterator unknown(meta, "http://ovra.test/unregistered/");
  EXPECT_FALSE(unknown.Next());
  XMPIterator missing(meta, kXMP_NS_DC, "rights");
  EXPECT_FALSE(missing.Next());
  XMPIterator absentNS(meta, kXMP_NS_EXIF);
  EXPECT_FALSE(absentNS.Next());
  EXPECT_THROW(XMPIterator(meta, kXMP_NS_DC, kXMP_IterJustChildren | 0x1), XMP_Error);
}

TEST(XMPIterator, KeepsThePacketAlive) {
  XMPMeta* meta = new XMPMeta(xmptest::Parse(xmptest::RealWorldPacket()));
  XMPIterator it(*meta, kXMP_NS_XMP, kXMP_IterJustChildren);
  delete meta;
  std::string path;
  int count = 0;
  while (it.Next(nullptr, &path)) ++count;
  EXPECT_EQ(count, 3);
}
