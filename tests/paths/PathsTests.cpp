// Paths: ordering, every constructor, resolution back to definitions and
// the child and leaf walks, on definitions registered by the test.
#include <iterator>
#include <set>

#include <ovraxmp/XMPError.h>

#include "MetadataTestSupport.h"

namespace ovrametadata {
namespace {

using ovratest::Descriptions;

const char kNS[] = "http://ns.ovra.test/paths/1.0/";

const char kDefinitions[] = R"(<xmp_definitions>
  <xmp_type name="ptOrigin">
    <xmp_field name="lat" type="real" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
    <xmp_field name="lon" type="real" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
  </xmp_type>
  <xmp_type name="ptPoint">
    <xmp_field name="x" type="integer" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
    <xmp_field name="y" type="integer" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
    <xmp_field name="origin" type="ptOrigin" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
  </xmp_type>
  <xmp_type name="ptNode">
    <xmp_field name="label" type="text" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
    <xmp_field name="next" type="ptNode" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
  </xmp_type>
  <xmp_type name="ptPointList" extends="seq" element_type="ptPoint"/>
  <xmp_schema namespace="http://ns.ovra.test/paths/1.0/" prefix="pt" label="Paths test">
    <xmp_property name="Title" type="text"/>
    <xmp_property name="Keywords" type="bag" element_type="text"/>
    <xmp_property name="Caption" type="alt" element_type="text" category="internal"/>
    <xmp_property name="Point" type="ptPoint">
      <xmp_qualifier name="unit" type="text"/>
      <xmp_qualifier name="source" type="text" namespace="http://ns.ovra.test/paths/fields/" prefix="ptf"/>
      <xmp_qualifier name="bad" type="text" namespace="http://ns.ovra.test/paths/unregistered/" prefix="ptu"/>
    </xmp_property>
    <xmp_property name="Points" type="seq" element_type="ptPoint" category="internal"/>
    <xmp_property name="Tags" type="bag" element_type="text" category="internal"/>
    <xmp_property name="Route" type="ptPointList" category="internal"/>
    <xmp_property name="Chain" type="ptNode"/>
  </xmp_schema>
</xmp_definitions>)";

class PathsTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() { ovratest::InitializeWithDefinitions(kDefinitions, kNS); }
  static void TearDownTestSuite() { Terminate(); }

  static Path P(const char* name) { return ovratest::PathOf(kNS, name); }
  static boost::shared_ptr<FieldDefinition> Field(const char* type, const char* name) {
    return FieldNameDefinition(TypeIdDefinition(type), name);
  }
  static boost::shared_ptr<QualifierDefinition> Qualifier(const char* name) {
    for (const auto& qualifier : PropertyNameDefinition(NamespaceDefinition(kNS), "Point")->constraints.qualifiers)
      if (qualifier->name == name) return qualifier;
    return nullptr;
  }
};

bool IsEmpty(const Path& path) {
  return !path.internal && path.namespaceURI.empty() && path.description.empty() && path.entry_name.empty() &&
         path.parent_id.empty();
}

void ExpectPath(const Path& path, bool internal, const std::string& description, const std::string& entryName,
                const std::string& parentId) {
  SCOPED_TRACE(description);
  EXPECT_EQ(path.internal, internal);
  EXPECT_EQ(path.namespaceURI, kNS);
  EXPECT_EQ(path.description, description);
  EXPECT_EQ(path.entry_name, entryName);
  EXPECT_EQ(path.parent_id, parentId);
}

TEST_F(PathsTest, OrderingUsesNamespaceThenDescriptionOnly) {
  Path a = P("Title");
  Path b = a;
  b.internal = !a.internal;
  b.entry_name = "other";
  b.parent_id = "elsewhere";
  EXPECT_FALSE(a < b);
  EXPECT_FALSE(b < a);
  EXPECT_EQ((std::set<Path>{a, b}).size(), 1u);

  Path first, second;
  first.namespaceURI = "http://a/";
  first.description = "zzz";
  second.namespaceURI = "http://b/";
  second.description = "aaa";
  EXPECT_TRUE(first < second);
  EXPECT_FALSE(second < first);
  second.namespaceURI = first.namespaceURI;
  EXPECT_TRUE(second < first);
}

TEST_F(PathsTest, PropertyPathsNeedARegisteredSchemaAndProperty) {
  ExpectPath(P("Title"), false, "Title", "Title", kNS);
  ExpectPath(P("Tags"), true, "Tags", "Tags", kNS);
  ExpectPath(PathForSchemaNameAndPropertyName(UTF16String(u"http://ns.ovra.test/paths/1.0/"), UTF16String(u"Title")),
             false, "Title", "Title", kNS);
  EXPECT_TRUE(IsEmpty(CreatePathFromSchemaProperty(NamespaceDefinition(kNS), nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromSchemaPropertyName(nullptr, "Title")));
  EXPECT_TRUE(IsEmpty(PathForSchemaNameAndPropertyName("http://ns.ovra.test/none/", "Title")));
  EXPECT_TRUE(IsEmpty(PathForSchemaNameAndPropertyName(kNS, "Missing")));
  EXPECT_TRUE(IsEmpty(PathForSchemaNameAndPropertyName(UTF16String(u"x"), UTF16String(u"y"))));
}

TEST_F(PathsTest, StructureFieldsComposeThroughTheToolkitAndFailQuietly) {
  const Path point = P("Point");
  ExpectPath(CreatePathFromStructureField(point, Field("ptPoint", "x")), false, "Point/ptf:x", "x", "ptPoint");
  const Path origin = CreatePathFromStructureField(point, Field("ptPoint", "origin"));
  const Path lat = CreatePathFromStructureField(origin, Field("ptOrigin", "lat"));
  ExpectPath(lat, false, "Point/ptf:origin/ptf:lat", "lat", "ptOrigin");
  EXPECT_EQ(PrimitiveTypeOfPath(lat), kPrimitiveType_real);

  EXPECT_TRUE(IsEmpty(CreatePathFromStructureField(point, nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromStructureField(Path(), Field("ptPoint", "x"))));
  auto stray = boost::make_shared<FieldDefinition>();
  stray->name = "stray";
  stray->namespaceURI = "http://ns.ovra.test/paths/never-registered/";
  Path result;
  EXPECT_NO_THROW(result = CreatePathFromStructureField(point, stray));
  EXPECT_TRUE(IsEmpty(result));
}

TEST_F(PathsTest, QualifiersComposeInTheirOwnOrTheSchemaNamespaceAndThrowOnFailure) {
  const Path point = P("Point");
  ExpectPath(CreatePathFromQualifier(point, Qualifier("unit")), false, "Point/?pt:unit", "unit", "ptPoint");
  EXPECT_EQ(CreatePathFromQualifier(point, Qualifier("source")).description, "Point/?ptf:source");
  EXPECT_TRUE(IsEmpty(CreatePathFromQualifier(point, nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromQualifier(Path(), Qualifier("unit"))));
  // Unlike a structure field, a qualifier the toolkit cannot address throws.
  EXPECT_THROW(CreatePathFromQualifier(point, Qualifier("bad")), ovraxmp::XMP_Error);
}

TEST_F(PathsTest, ArrayItemsNameTheirElementType) {
  const Path second = CreatePathFromArrayItem(P("Keywords"), 2);
  ExpectPath(second, false, "Keywords[2]", "text", "bag");  // not internal: the array's own type
  EXPECT_EQ(PrimitiveTypeOfPath(second), kPrimitiveType_text);
  EXPECT_EQ(CreatePathFromArrayItem(P("Keywords"), -1).description, "Keywords[last()]");
  EXPECT_TRUE(IsEmpty(CreatePathFromArrayItem(P("Title"), 1)));
  EXPECT_TRUE(IsEmpty(CreatePathFromArrayItem(Path(), 1)));
}

TEST_F(PathsTest, FieldsOfStructureItemsKeepTheInternalMark) {
  const Path item = CreatePathFromArrayItem(P("Points"), 1);
  ExpectPath(item, true, "Points[1]", "ptPoint", "ptPoint");  // internal: the element type
  const Path origin = CreatePathFromArrayedStructureField(item, Field("ptPoint", "origin"));
  ExpectPath(origin, true, "Points[1]/ptf:origin", "origin", "ptPoint");
  ExpectPath(CreatePathFromStructureField(origin, Field("ptOrigin", "lon")), true, "Points[1]/ptf:origin/ptf:lon",
             "lon", "ptOrigin");
  EXPECT_TRUE(IsEmpty(CreatePathFromArrayedStructureField(item, nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromArrayedStructureField(P("Title"), Field("ptPoint", "x"))));
}

TEST_F(PathsTest, ElementTypePathKeepsTheLocation) {
  const Path tags = P("Tags");
  const auto entry = PathEntryDefinition(tags);
  const auto type = TypeIdDefinition("text");
  ExpectPath(CreatePathFromElementType(tags, entry, type), true, "Tags", "Tags", "text");
  EXPECT_TRUE(IsEmpty(CreatePathFromElementType(tags, nullptr, type)));
  EXPECT_TRUE(IsEmpty(CreatePathFromElementType(tags, entry, nullptr)));
}

TEST_F(PathsTest, DynamicSchemaResolvesAnyNameAsText) {
  const UTF8String dynamicNS = MakeDynamicSchemaNamespace("pathsclips");
  if (!NamespaceDefinition(dynamicNS))
    ParseBufferAndRegisterDefinitions(
        "<xmp_definitions><xmp_schema namespace=\"" + dynamicNS + "\" prefix=\"ptdyn\" dynamic=\"true\"/></xmp_definitions>",
        u"dyn", false);
  Path path;
  path.namespaceURI = dynamicNS;
  path.description = path.entry_name = "Whatever";
  path.parent_id = dynamicNS;
  const auto entry = PathEntryDefinition(path);
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry->name, "Whatever");
  EXPECT_EQ(PrimitiveTypeOfPath(path), kPrimitiveType_text);
  EXPECT_TRUE(IsPathLeaf(path));
}

TEST_F(PathsTest, EmptyPathResolvesToNothing) {
  const Path empty;
  EXPECT_FALSE(PathEntryDefinition(empty));
  EXPECT_FALSE(TypeEntryDefinition(empty));
  EXPECT_FALSE(PrimitiveTypeOfPath(empty));
  EXPECT_FALSE(IsPathAnArray(empty, true));
  EXPECT_TRUE(boost::empty(ChildPaths(empty)));
  EXPECT_TRUE(IsPathLeaf(empty));
  EXPECT_TRUE(boost::empty(DescendantLeafPaths(boost::shared_ptr<SchemaDefinition>())));
}

TEST_F(PathsTest, OnlyInternalOrForcedBagsAndSeqsAreArraysWithElementTypes) {
  EXPECT_FALSE(IsPathAnArray(P("Keywords"), false));
  EXPECT_TRUE(IsPathAnArray(P("Keywords"), true));
  EXPECT_TRUE(IsPathAnArray(P("Tags"), false));
  EXPECT_TRUE(IsPathAnArray(P("Route"), false));    // a named type extending seq
  EXPECT_FALSE(IsPathAnArray(P("Caption"), true));  // alt never is
  EXPECT_FALSE(IsPathAnArray(P("Title"), true));
  // The type of an array's value is its element type only when it is one.
  EXPECT_EQ(TypeEntryDefinition(P("Route"))->name, "ptPoint");
  EXPECT_EQ(TypeEntryDefinition(P("Keywords"))->name, "bag");
}

TEST_F(PathsTest, ChildrenAndLeavesFollowFieldOrderDepthFirst) {
  EXPECT_EQ(Descriptions(ChildPaths(P("Point"))),
            (std::vector<std::string>{"Point/ptf:x", "Point/ptf:y", "Point/ptf:origin"}));
  EXPECT_TRUE(IsPathLeaf(P("Title")));
  EXPECT_TRUE(IsPathLeaf(P("Keywords")));  // not internal: a plain value
  EXPECT_FALSE(IsPathLeaf(P("Point")));
  EXPECT_EQ(Descriptions(DescendantLeafPaths(P("Title"))), std::vector<std::string>{"Title"});

  // Internal arrays have element or field children.
  const auto tagChildren = ChildPaths(P("Tags"));
  ASSERT_EQ(boost::size(tagChildren), 1);
  EXPECT_EQ(tagChildren.front().description, "Tags");
  EXPECT_EQ(tagChildren.front().parent_id, "text");
  const auto pointChildren = ChildPaths(P("Points"));
  EXPECT_EQ(Descriptions(pointChildren),
            (std::vector<std::string>{"Points/ptf:x", "Points/ptf:y", "Points/ptf:origin"}));
  for (const Path& child : pointChildren) EXPECT_TRUE(child.internal);

  EXPECT_EQ(Descriptions(DescendantLeafPaths(NamespaceDefinition(kNS))),
            (std::vector<std::string>{"Title", "Keywords", "Caption", "Point/ptf:x", "Point/ptf:y",
                                      "Point/ptf:origin/ptf:lat", "Point/ptf:origin/ptf:lon", "Points/ptf:x",
                                      "Points/ptf:y", "Points/ptf:origin/ptf:lat", "Points/ptf:origin/ptf:lon",
                                      "Tags", "Route/ptf:x", "Route/ptf:y", "Route/ptf:origin/ptf:lat",
                                      "Route/ptf:origin/ptf:lon",
                                      "Chain/ptf:label"}));  // ptNode holds a ptNode: the walk stops there
  EXPECT_EQ(Descriptions(ChildPaths(NamespaceDefinition(kNS))).size(), 8u);
}

TEST_F(PathsTest, LeafRangeCanBeWalkedBothWays) {
  const auto leaves = DescendantLeafPaths(P("Point"));
  EXPECT_EQ(Descriptions(leaves), (std::vector<std::string>{"Point/ptf:x", "Point/ptf:y", "Point/ptf:origin/ptf:lat",
                                                            "Point/ptf:origin/ptf:lon"}));
  auto last = leaves.end();
  EXPECT_EQ((--last)->description, "Point/ptf:origin/ptf:lon");
  EXPECT_EQ((--last)->description, "Point/ptf:origin/ptf:lat");
  EXPECT_EQ(std::distance(leaves.begin(), leaves.end()), 4);
}

}  // namespace
}  // namespace ovrametadata
