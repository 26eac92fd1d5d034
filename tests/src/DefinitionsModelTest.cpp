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
  EXPECT_FALSE(PrimitiveTypeIdAsPrimitiveType("Text"));
  EXPECT_FALSE(PrimitiveTypeIdAsPrimitiveType("date"));
  EXPECT_FALSE(PrimitiveTypeIdAsPrimitiveType(""));
  EXPECT_FALSE(PrimitiveTypeIdAsPrimitiveType("text "));
  EXPECT_EQ(PrimitiveTypeAsPrimitiveTypeId(static_cast<PrimitiveType>(9)), "");
  EXPECT_EQ(PrimitiveTypeAsPrimitiveTypeId(static_cast<PrimitiveType>(-1)), "");
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

TEST(DateValue, DefaultIsAllZerosAndOrderingIsFieldByField) {
  const Date zero;
  EXPECT_EQ(zero.year, 0);
  EXPECT_EQ(zero.second, 0);
  EXPECT_TRUE(zero == Date());
  EXPECT_FALSE(zero < Date());

  Date a{2024, 5, 17, 10, 30, 15};
  Date b = a;
  b.second = 16;
  EXPECT_TRUE(a < b);
  EXPECT_FALSE(b < a);
  EXPECT_FALSE(a == b);

  // The year decides before every later field.
  Date earlierYear{2023, 12, 31, 23, 59, 59};
  EXPECT_TRUE(earlierYear < a);
  Date laterMonth{2024, 6, 1, 0, 0, 0};
  EXPECT_TRUE(a < laterMonth);
  EXPECT_TRUE(a == (Date{2024, 5, 17, 10, 30, 15}));
}

TypeDefinition MakeType(boost::optional<std::string> type, boost::optional<PrimitiveType> extends,
                        boost::optional<std::string> elementType = boost::none) {
  TypeDefinition definition;
  definition.type = type;
  definition.extends = extends;
  definition.constraints.elementType = elementType;
  return definition;
}

TEST(TypeDefinitionQueries, KindComesFromThePrimitiveIdElseFromExtends) {
  EXPECT_EQ(PrimitiveTypeOf(MakeType(std::string("bag"), kPrimitiveType_seq)),
            boost::make_optional(kPrimitiveType_bag));
  EXPECT_EQ(PrimitiveTypeOf(MakeType(std::string("myList"), kPrimitiveType_seq)),
            boost::make_optional(kPrimitiveType_seq));
  EXPECT_FALSE(PrimitiveTypeOf(MakeType(std::string("myStruct"), boost::none)));
  EXPECT_FALSE(PrimitiveTypeOf(MakeType(boost::none, kPrimitiveType_seq)));

  EXPECT_TRUE(IsArrayType(MakeType(std::string("myList"), kPrimitiveType_alt)));
  EXPECT_FALSE(IsArrayType(MakeType(std::string("myChoice"), kPrimitiveType_closedchoice)));
}

TEST(TypeDefinitionQueries, StructIsDecidedByFieldsAlone) {
  TypeDefinition type = MakeType(std::string("text"), boost::none);
  EXPECT_FALSE(IsStructType(type));
  type.fields.push_back(boost::make_shared<FieldDefinition>());
  EXPECT_TRUE(IsStructType(type));
  // A struct has no element type even when it extends an array kind.
  type.extends = kPrimitiveType_bag;
  type.constraints.elementType = std::string("text");
  EXPECT_FALSE(ElementTypeIdOf(type));
}

TEST(TypeDefinitionQueries, SimpleAndElementTypes) {
  EXPECT_TRUE(IsSimpleType(MakeType(std::string("real"), boost::none)));
  EXPECT_TRUE(IsSimpleType(MakeType(std::string("rating"), kPrimitiveType_integer)));
  EXPECT_TRUE(IsSimpleType(
      MakeType(std::string("mode"), kPrimitiveType_closedchoice, std::string("integer"))));
  EXPECT_FALSE(IsSimpleType(MakeType(std::string("mode"), kPrimitiveType_closedchoice)));
  EXPECT_FALSE(IsSimpleType(MakeType(std::string("list"), kPrimitiveType_bag, std::string("text"))));
  EXPECT_FALSE(IsSimpleType(MakeType(boost::none, kPrimitiveType_text)));

  EXPECT_EQ(ElementTypeIdOf(MakeType(std::string("list"), kPrimitiveType_bag, std::string("real"))),
            boost::make_optional(std::string("real")));
  // Element types count only for choices and arrays that extend their kind.
  EXPECT_FALSE(ElementTypeIdOf(MakeType(std::string("bag"), boost::none, std::string("real"))));
  EXPECT_FALSE(ElementTypeIdOf(
      MakeType(std::string("rating"), kPrimitiveType_integer, std::string("real"))));
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
