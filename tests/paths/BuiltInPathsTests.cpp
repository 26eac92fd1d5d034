// Path resolution over the built-in structures and arrays (the real-world
// property table of the built-in definitions tests covers simple paths and
// the fields of structures).
#include "MetadataTestSupport.h"

namespace ovrametadata {
namespace {

using ovratest::Descriptions;

const char kDC[] = "http://purl.org/dc/elements/1.1/";
const char kDM[] = "http://ns.adobe.com/xmp/1.0/DynamicMedia/";

class BuiltInPathsTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() { Initialize(); }
  static void TearDownTestSuite() { Terminate(); }
  static Path P(const char* ns, const char* name) { return ovratest::PathOf(ns, name); }
};

TEST_F(BuiltInPathsTest, ArrayItemsOfBuiltInArrays) {
  const Path item = CreatePathFromArrayItem(P(kDC, "creator"), 1);
  EXPECT_EQ(item.description, "creator[1]");
  EXPECT_EQ(item.entry_name, "propername");
  EXPECT_TRUE(PathEntryDefinition(item));
  EXPECT_EQ(PrimitiveTypeOfPath(item), kPrimitiveType_text);
  // Alternatives have no items of their own here: their element is a
  // container value, not an array element.
  EXPECT_FALSE(IsPathAnArray(P(kDC, "title"), true));
}

TEST_F(BuiltInPathsTest, MarkersAreAPlainValueUnlessInternal) {
  Path markers = P(kDM, "markers");
  EXPECT_EQ(Descriptions(DescendantLeafPaths(markers)), std::vector<std::string>{"markers"});

  // As an internal array the walk enters the Marker structure, and the
  // nested array of cue point parameters with it.
  markers.internal = true;
  EXPECT_EQ(TypeEntryDefinition(markers)->name, "Marker");
  EXPECT_EQ(Descriptions(DescendantLeafPaths(markers)),
            (std::vector<std::string>{"markers/xmpDM:comment", "markers/xmpDM:cuePointParams/xmpDM:key",
                                      "markers/xmpDM:cuePointParams/xmpDM:value", "markers/xmpDM:cuePointType",
                                      "markers/xmpDM:duration", "markers/xmpDM:guid", "markers/xmpDM:location",
                                      "markers/xmpDM:name", "markers/xmpDM:probability", "markers/xmpDM:speaker",
                                      "markers/xmpDM:startTime", "markers/xmpDM:target", "markers/xmpDM:type"}));

  // The fields of one marker.
  const Path first = CreatePathFromArrayItem(markers, 1);
  EXPECT_EQ(first.entry_name, "Marker");
  const Path name = CreatePathFromArrayedStructureField(
      first, FieldNameDefinition(TypeIdDefinition("Marker"), "name"));
  EXPECT_EQ(name.description, "markers[1]/xmpDM:name");
  EXPECT_EQ(PrimitiveTypeOfPath(name), kPrimitiveType_text);
}

TEST_F(BuiltInPathsTest, EverySchemaWalksToAddressableLeaves) {
  std::size_t schemas = 0;
  std::size_t leaves = 0;
  for (const auto& schema : CommonSchemaDefinitions()) {
    ++schemas;
    for (const Path& leaf : DescendantLeafPaths(schema)) {
      ++leaves;
      EXPECT_EQ(leaf.namespaceURI, schema->namespaceURI);
      EXPECT_FALSE(leaf.description.empty());
      EXPECT_TRUE(IsPathLeaf(leaf)) << leaf.description;
    }
  }
  EXPECT_GE(schemas, 28u);
  EXPECT_GT(leaves, schemas * 5);
}

}  // namespace
}  // namespace ovrametadata
