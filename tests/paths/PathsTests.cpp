// Paths: ordering, every constructor, resolution back to definitions and
// the child and leaf walks, on definitions registered by the test.
#include <iterator>
#include <set>
#include <string>
#include <vector>

#include <boost/make_shared.hpp>
#include <boost/optional/optional_io.hpp>
#include <gtest/gtest.h>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>
#include <ovraxmp/XMPError.h>

namespace ovrametadata {
namespace {

const char kNS[] = "http://ns.ovra.test/paths/1.0/";
const char kFieldNS[] = "http://ns.ovra.test/paths/fields/";

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
  static void SetUpTestSuite() {
    Initialize();
    if (!NamespaceDefinition(kNS)) {
      ParseBufferAndRegisterDefinitions(kDefinitions, u"paths-test", false);
    }
  }
  static void TearDownTestSuite() { Terminate(); }
  void SetUp() override { ASSERT_TRUE(NamespaceDefinition(kNS)); }

  static Path PropertyPath(const char* name) { return PathForSchemaNameAndPropertyName(kNS, name); }
  static boost::shared_ptr<FieldDefinition> Field(const char* type, const char* name) {
    return FieldNameDefinition(TypeIdDefinition(type), name);
  }
  static boost::shared_ptr<QualifierDefinition> Qualifier(const char* property,
                                                          const char* name) {
    auto entry = PropertyNameDefinition(NamespaceDefinition(kNS), property);
    for (const auto& qualifier : entry->constraints.qualifiers) {
      if (qualifier->name == name) return qualifier;
    }
    return nullptr;
  }
};

bool IsEmpty(const Path& path) {
  return !path.internal && path.namespaceURI.empty() && path.description.empty() &&
         path.entry_name.empty() && path.parent_id.empty();
}

std::vector<std::string> Descriptions(const Range<Path>& paths) {
  std::vector<std::string> result;
  for (const Path& path : paths) result.push_back(path.description);
  return result;
}

// ---- Ordering ----

TEST_F(PathsTest, OrderingUsesNamespaceThenDescriptionOnly) {
  Path a = PropertyPath("Title");
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

// ---- Constructors ----

TEST_F(PathsTest, PropertyPathsNeedARegisteredSchemaAndProperty) {
  const Path path = PropertyPath("Title");
  EXPECT_FALSE(path.internal);
  EXPECT_EQ(path.namespaceURI, kNS);
  EXPECT_EQ(path.description, "Title");
  EXPECT_EQ(path.entry_name, "Title");
  EXPECT_EQ(path.parent_id, kNS);
  EXPECT_TRUE(PropertyPath("Tags").internal);
  const Path wide = PathForSchemaNameAndPropertyName(UTF16String(u"http://ns.ovra.test/paths/1.0/"),
                                                     UTF16String(u"Title"));
  EXPECT_EQ(wide.description, "Title");
  EXPECT_EQ(wide.parent_id, kNS);

  EXPECT_TRUE(IsEmpty(CreatePathFromSchemaProperty(NamespaceDefinition(kNS), nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromSchemaPropertyName(nullptr, "Title")));
  EXPECT_TRUE(IsEmpty(PathForSchemaNameAndPropertyName("http://ns.ovra.test/none/", "Title")));
  EXPECT_TRUE(IsEmpty(PathForSchemaNameAndPropertyName(kNS, "Missing")));
  EXPECT_TRUE(IsEmpty(PathForSchemaNameAndPropertyName(UTF16String(u"x"), UTF16String(u"y"))));
}

TEST_F(PathsTest, StructureFieldsComposeThroughTheToolkit) {
  const Path point = PropertyPath("Point");
  const Path x = CreatePathFromStructureField(point, Field("ptPoint", "x"));
  EXPECT_EQ(x.namespaceURI, kNS);
  EXPECT_EQ(x.description, "Point/ptf:x");
  EXPECT_EQ(x.entry_name, "x");
  EXPECT_EQ(x.parent_id, "ptPoint");

  const Path origin = CreatePathFromStructureField(point, Field("ptPoint", "origin"));
  const Path lat = CreatePathFromStructureField(origin, Field("ptOrigin", "lat"));
  EXPECT_EQ(lat.description, "Point/ptf:origin/ptf:lat");
  EXPECT_EQ(lat.parent_id, "ptOrigin");
  EXPECT_EQ(PrimitiveTypeOfPath(lat), kPrimitiveType_real);
}

TEST_F(PathsTest, StructureFieldFailuresGiveEmptyPathWithoutThrowing) {
  const Path point = PropertyPath("Point");
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
  const Path point = PropertyPath("Point");
  const Path unit = CreatePathFromQualifier(point, Qualifier("Point", "unit"));
  EXPECT_EQ(unit.description, "Point/?pt:unit");
  EXPECT_EQ(unit.entry_name, "unit");
  EXPECT_EQ(unit.parent_id, "ptPoint");
  const Path source = CreatePathFromQualifier(point, Qualifier("Point", "source"));
  EXPECT_EQ(source.description, "Point/?ptf:source");
  EXPECT_TRUE(IsEmpty(CreatePathFromQualifier(point, nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromQualifier(Path(), Qualifier("Point", "unit"))));
  // Unlike a structure field, a qualifier the toolkit cannot address throws.
  EXPECT_THROW(CreatePathFromQualifier(point, Qualifier("Point", "bad")), ovraxmp::XMP_Error);
}

TEST_F(PathsTest, ArrayItemsNameTheirElementType) {
  const Path keywords = PropertyPath("Keywords");
  const Path second = CreatePathFromArrayItem(keywords, 2);
  EXPECT_EQ(second.description, "Keywords[2]");
  EXPECT_EQ(second.entry_name, "text");
  EXPECT_EQ(second.parent_id, "bag");  // not internal: the array's own type
  EXPECT_EQ(PrimitiveTypeOfPath(second), kPrimitiveType_text);
  EXPECT_EQ(CreatePathFromArrayItem(keywords, -1).description, "Keywords[last()]");

  EXPECT_TRUE(IsEmpty(CreatePathFromArrayItem(PropertyPath("Title"), 1)));
  EXPECT_TRUE(IsEmpty(CreatePathFromArrayItem(Path(), 1)));
}

TEST_F(PathsTest, FieldsOfStructureItemsKeepTheInternalMark) {
  const Path points = PropertyPath("Points");
  ASSERT_TRUE(points.internal);
  const Path item = CreatePathFromArrayItem(points, 1);
  EXPECT_TRUE(item.internal);
  EXPECT_EQ(item.entry_name, "ptPoint");
  EXPECT_EQ(item.parent_id, "ptPoint");  // internal: the element type

  const Path origin = CreatePathFromArrayedStructureField(item, Field("ptPoint", "origin"));
  EXPECT_TRUE(origin.internal);
  EXPECT_EQ(origin.description, "Points[1]/ptf:origin");
  EXPECT_EQ(origin.parent_id, "ptPoint");
  const Path lon = CreatePathFromStructureField(origin, Field("ptOrigin", "lon"));
  EXPECT_TRUE(lon.internal);
  EXPECT_EQ(lon.description, "Points[1]/ptf:origin/ptf:lon");

  EXPECT_TRUE(IsEmpty(CreatePathFromArrayedStructureField(item, nullptr)));
  EXPECT_TRUE(IsEmpty(CreatePathFromArrayedStructureField(PropertyPath("Title"),
                                                          Field("ptPoint", "x"))));
}

TEST_F(PathsTest, ElementTypePathKeepsTheLocation) {
  const Path tags = PropertyPath("Tags");
  auto entry = PathEntryDefinition(tags);
  auto type = TypeIdDefinition("text");
  const Path element = CreatePathFromElementType(tags, entry, type);
  EXPECT_TRUE(element.internal);
  EXPECT_EQ(element.description, "Tags");
  EXPECT_EQ(element.entry_name, "Tags");
  EXPECT_EQ(element.parent_id, "text");
  EXPECT_TRUE(IsEmpty(CreatePathFromElementType(tags, nullptr, type)));
  EXPECT_TRUE(IsEmpty(CreatePathFromElementType(tags, entry, nullptr)));
}

// ---- Resolution ----

TEST_F(PathsTest, DynamicSchemaResolvesAnyNameAsText) {
  const UTF8String dynamicNS = MakeDynamicSchemaNamespace("pathsclips");
  const std::string file = "<xmp_definitions><xmp_schema namespace=\"" + dynamicNS +
                           "\" prefix=\"ptdyn\" dynamic=\"true\"/></xmp_definitions>";
  if (!NamespaceDefinition(dynamicNS)) ParseBufferAndRegisterDefinitions(file, u"dyn", false);
  Path path;
  path.namespaceURI = dynamicNS;
  path.description = "Whatever";
  path.entry_name = "Whatever";
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
  EXPECT_FALSE(IsPathAnArray(PropertyPath("Keywords"), false));
  EXPECT_TRUE(IsPathAnArray(PropertyPath("Keywords"), true));
  EXPECT_TRUE(IsPathAnArray(PropertyPath("Tags"), false));
  EXPECT_TRUE(IsPathAnArray(PropertyPath("Route"), false));  // a named type extending seq
  EXPECT_FALSE(IsPathAnArray(PropertyPath("Caption"), true));  // alt never is
  EXPECT_FALSE(IsPathAnArray(PropertyPath("Title"), true));
  // The type of an array's value is its element type only when it is one.
  EXPECT_EQ(TypeEntryDefinition(PropertyPath("Route"))->name, "ptPoint");
  EXPECT_EQ(TypeEntryDefinition(PropertyPath("Keywords"))->name, "bag");
}

// ---- Children and leaves ----

TEST_F(PathsTest, StructureChildrenAndLeavesFollowFieldOrderDepthFirst) {
  EXPECT_EQ(Descriptions(ChildPaths(PropertyPath("Point"))),
            (std::vector<std::string>{"Point/ptf:x", "Point/ptf:y", "Point/ptf:origin"}));
  EXPECT_TRUE(IsPathLeaf(PropertyPath("Title")));
  EXPECT_TRUE(IsPathLeaf(PropertyPath("Keywords")));  // not internal: a plain value
  EXPECT_FALSE(IsPathLeaf(PropertyPath("Point")));
  EXPECT_EQ(Descriptions(DescendantLeafPaths(PropertyPath("Point"))),
            (std::vector<std::string>{"Point/ptf:x", "Point/ptf:y", "Point/ptf:origin/ptf:lat",
                                      "Point/ptf:origin/ptf:lon"}));
  // A leaf is its own only leaf.
  EXPECT_EQ(Descriptions(DescendantLeafPaths(PropertyPath("Title"))),
            (std::vector<std::string>{"Title"}));
}

TEST_F(PathsTest, InternalArraysHaveElementOrFieldChildren) {
  const auto tagChildren = ChildPaths(PropertyPath("Tags"));
  ASSERT_EQ(boost::size(tagChildren), 1);
  EXPECT_EQ(tagChildren.front().description, "Tags");
  EXPECT_EQ(tagChildren.front().parent_id, "text");

  const auto pointChildren = ChildPaths(PropertyPath("Points"));
  EXPECT_EQ(Descriptions(pointChildren),
            (std::vector<std::string>{"Points/ptf:x", "Points/ptf:y", "Points/ptf:origin"}));
  for (const Path& child : pointChildren) EXPECT_TRUE(child.internal);
}

TEST_F(PathsTest, SchemaLeavesCoverEveryPropertyInOrder) {
  const auto leaves = Descriptions(DescendantLeafPaths(NamespaceDefinition(kNS)));
  const std::vector<std::string> expected{
      "Title", "Keywords", "Caption", "Point/ptf:x", "Point/ptf:y", "Point/ptf:origin/ptf:lat",
      "Point/ptf:origin/ptf:lon", "Points/ptf:x", "Points/ptf:y", "Points/ptf:origin/ptf:lat",
      "Points/ptf:origin/ptf:lon", "Tags", "Route/ptf:x", "Route/ptf:y",
      "Route/ptf:origin/ptf:lat", "Route/ptf:origin/ptf:lon",
      "Chain/ptf:label"};  // ptNode holds a ptNode: the walk stops there
  EXPECT_EQ(leaves, expected);
  EXPECT_EQ(Descriptions(ChildPaths(NamespaceDefinition(kNS))).size(), 8u);
}

TEST_F(PathsTest, LeafRangeCanBeWalkedBackwards) {
  const auto leaves = DescendantLeafPaths(PropertyPath("Point"));
  auto last = leaves.end();
  --last;
  EXPECT_EQ(last->description, "Point/ptf:origin/ptf:lon");
  --last;
  EXPECT_EQ(last->description, "Point/ptf:origin/ptf:lat");
  EXPECT_EQ(std::distance(leaves.begin(), leaves.end()), 4);
}

}  // namespace
}  // namespace ovrametadata
