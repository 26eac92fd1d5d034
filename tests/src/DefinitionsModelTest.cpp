#include "MetadataTestSupport.h"

using namespace ovrametadata;

namespace {

TEST(PrimitiveTypes, TypeIdsRoundTripAndAreCaseSensitive) {
  const char* const ids[] = {"integer",    "real",         "text", "boolean", "openchoice",
                             "closedchoice", "bag",        "seq",  "alt"};
  for (int value = 0; value < 9; ++value) {
    const auto type = static_cast<PrimitiveType>(value);
    EXPECT_EQ(PrimitiveTypeAsPrimitiveTypeId(type), ids[value]);
    EXPECT_EQ(PrimitiveTypeIdAsPrimitiveType(ids[value]), boost::make_optional(type));
  }
  for (const char* id : {"Text", "date", "", "text "}) EXPECT_FALSE(PrimitiveTypeIdAsPrimitiveType(id)) << id;
  for (int value : {9, -1}) EXPECT_EQ(PrimitiveTypeAsPrimitiveTypeId(static_cast<PrimitiveType>(value)), "");
}

TEST(PrimitiveTypes, ClassPredicates) {
  struct Expected {
    PrimitiveType type;
    bool simple, choice, array, container;
  };
  const Expected table[] = {
      {kPrimitiveType_integer, true, false, false, false},
      {kPrimitiveType_real, true, false, false, false},
      {kPrimitiveType_text, true, false, false, false},
      {kPrimitiveType_boolean, true, false, false, false},
      {kPrimitiveType_openchoice, false, true, false, true},
      {kPrimitiveType_closedchoice, false, true, false, true},
      {kPrimitiveType_bag, false, false, true, false},
      {kPrimitiveType_seq, false, false, true, false},
      {kPrimitiveType_alt, false, false, true, true},
  };
  for (const auto& row : table) {
    SCOPED_TRACE(PrimitiveTypeAsPrimitiveTypeId(row.type));
    EXPECT_EQ(PrimitiveTypeIsSimple(row.type), row.simple);
    EXPECT_EQ(IsTypeSimpleScalar(row.type), row.simple);
    EXPECT_EQ(PrimitiveTypeIsChoice(row.type), row.choice);
    EXPECT_EQ(PrimitiveTypeIsArray(row.type), row.array);
    EXPECT_EQ(IsTypeContainer(row.type), row.container);
  }
  EXPECT_FALSE(PrimitiveTypeIsSimple(static_cast<PrimitiveType>(9)));
  EXPECT_FALSE(PrimitiveTypeIsArray(static_cast<PrimitiveType>(9)));
}

TEST(PrimitiveTypes, SimpleScalarElementsNeedNoRegistry) {
  for (const char* id : {"integer", "real", "text", "boolean"}) {
    EXPECT_TRUE(IsElementSimpleScalar(id)) << id;
    EXPECT_TRUE(DoesElementConformToContainer(id)) << id;
  }
  for (const char* id : {"bag", "openchoice", "date", "Text"}) {
    EXPECT_FALSE(IsElementSimpleScalar(id)) << id;
  }
}

TEST(DateValue, OrderingIsFieldByFieldFromTheYear) {
  EXPECT_TRUE(Date() == (Date{0, 0, 0, 0, 0, 0}));
  EXPECT_FALSE(Date() < Date());
  const Date a{2024, 5, 17, 10, 30, 15};
  for (const Date& later : {Date{2024, 5, 17, 10, 30, 16}, Date{2024, 6, 1, 0, 0, 0}, Date{2025, 1, 1, 0, 0, 0}}) {
    EXPECT_TRUE(a < later);
    EXPECT_FALSE(later < a);
    EXPECT_FALSE(a == later);
  }
  EXPECT_TRUE((Date{2023, 12, 31, 23, 59, 59}) < a);
  EXPECT_TRUE(a == (Date{2024, 5, 17, 10, 30, 15}));
}

TEST(TypeDefinitionQueries, KindSimpleArrayAndElementTypeOfUnregisteredTypes) {
  using Text = boost::optional<std::string>;
  using Kind = boost::optional<PrimitiveType>;
  const struct {
    Text type;
    Kind extends;
    Text elementType;
    Kind kind;  // from the primitive id, else from extends
    bool simple, array;
    Text elementTypeOf;  // only choices and arrays that extend their kind
  } cases[] = {
      {Text("bag"), kPrimitiveType_seq, {}, kPrimitiveType_bag, false, true, {}},
      {Text("myList"), kPrimitiveType_seq, {}, kPrimitiveType_seq, false, true, {}},
      {Text("myList"), kPrimitiveType_alt, {}, kPrimitiveType_alt, false, true, {}},
      {Text("myStruct"), {}, {}, {}, false, false, {}},
      {{}, kPrimitiveType_seq, {}, {}, false, false, {}},
      {{}, kPrimitiveType_text, {}, {}, false, false, {}},
      {Text("myChoice"), kPrimitiveType_closedchoice, {}, kPrimitiveType_closedchoice, false, false, {}},
      {Text("real"), {}, {}, kPrimitiveType_real, true, false, {}},
      {Text("rating"), kPrimitiveType_integer, {}, kPrimitiveType_integer, true, false, {}},
      {Text("mode"), kPrimitiveType_closedchoice, Text("integer"), kPrimitiveType_closedchoice, true, false,
       Text("integer")},
      {Text("list"), kPrimitiveType_bag, Text("real"), kPrimitiveType_bag, false, true, Text("real")},
      {Text("bag"), {}, Text("real"), kPrimitiveType_bag, false, true, {}},
      {Text("rating"), kPrimitiveType_integer, Text("real"), kPrimitiveType_integer, true, false, {}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.type.value_or("-"));
    TypeDefinition definition;
    definition.type = c.type;
    definition.extends = c.extends;
    definition.constraints.elementType = c.elementType;
    EXPECT_EQ(PrimitiveTypeOf(definition), c.kind);
    EXPECT_EQ(IsSimpleType(definition), c.simple);
    EXPECT_EQ(IsArrayType(definition), c.array);
    EXPECT_EQ(ElementTypeIdOf(definition), c.elementTypeOf);
  }
}

TEST(TypeDefinitionQueries, StructIsDecidedByFieldsAlone) {
  TypeDefinition type;
  type.type = std::string("text");
  EXPECT_FALSE(IsStructType(type));
  type.fields.push_back(boost::make_shared<FieldDefinition>());
  EXPECT_TRUE(IsStructType(type));
  // A struct has no element type even when it extends an array kind.
  type.extends = kPrimitiveType_bag;
  type.constraints.elementType = std::string("text");
  EXPECT_FALSE(ElementTypeIdOf(type));
}

TEST(EntryDefinitionQueries, PrimitiveEntriesUseTheirOwnElementType) {
  PropertyDefinition property;
  EXPECT_FALSE(PrimitiveTypeOf(property));
  EXPECT_FALSE(ElementTypeIdOf(property));
  property.type = std::string("seq");
  property.constraints.elementType = std::string("integer");
  EXPECT_EQ(PrimitiveTypeOf(property), boost::make_optional(kPrimitiveType_seq));
  EXPECT_EQ(ElementTypeIdOf(property), boost::make_optional(std::string("integer")));
  property.type = std::string("text");
  EXPECT_FALSE(ElementTypeIdOf(property));
}

TEST(Factories, PropertiesGetTheTypeIdOfTheirPrimitiveType) {
  const auto schema = CreateNewSchema("http://example.com/ns/", "ex", u"$$$/a/b=Label", u"Label",
                                      u"", u"");
  EXPECT_TRUE(schema->isCustom);
  EXPECT_EQ(ovratest::U8(schema->labelSource), "$$$/a/b=Label");

  const auto property = CreateNewProperty(kPrimitiveType_alt, "title", u"src", u"Title", u"", u"");
  EXPECT_EQ(property->type, boost::make_optional(std::string("alt")));
  EXPECT_FALSE(property->isInternal);
  EXPECT_FALSE(CreateNewProperty(static_cast<PrimitiveType>(12), "x", u"", u"", u"", u"")->type);
}

}  // namespace
