#include "MetadataTestSupport.h"

using namespace ovrametadata;
using ovratest::ErrorsSince;

namespace {

const std::u16string kSource = u"/defs/test.xml";
const std::string kRegistering = "Error registering definition: ";
using Text = boost::optional<std::string>;

TypeDefinitionPtr NewType(const std::string& name, boost::optional<PrimitiveType> extends = boost::none,
                          Text elementType = boost::none) {
  auto type = boost::make_shared<TypeDefinition>();
  type->name = name;
  type->extends = extends;
  type->constraints.elementType = elementType;
  return type;
}

boost::shared_ptr<FieldDefinition> NewField(const std::string& name, const std::string& ns,
                                            const std::string& prefix, Text type) {
  auto field = boost::make_shared<FieldDefinition>();
  field->name = name;
  field->namespaceURI = ns;
  field->prefix = prefix;
  field->type = type;
  return field;
}

PropertyDefinitionPtr NewProperty(const std::string& name, Text type, Text elementType = boost::none) {
  auto property = boost::make_shared<PropertyDefinition>();
  property->name = name;
  property->type = type;
  property->constraints.elementType = elementType;
  return property;
}

SchemaDefinitionPtr NewSchema(const std::string& ns, const std::string& prefix,
                              std::vector<PropertyDefinitionPtr> properties = {}) {
  auto schema = CreateNewSchema(ns, prefix, u"", u"", u"", u"");
  schema->properties = std::move(properties);
  return schema;
}

class Registry : public ::testing::Test {
 protected:
  ovratest::LibraryScope library;
};

TEST(RegistryLifecycle, AnswersNothingWhileNotInitialised) {
  ErrorsSince since;
  EXPECT_FALSE(RegisterTypeDefinition(NewType("lonely"), kSource));
  EXPECT_FALSE(RegisterSchemaDefinition(NewSchema("http://example.com/lonely/", "lonely"), kSource, false));
  EXPECT_FALSE(NamespaceDefinition("http://purl.org/dc/elements/1.1/"));
  EXPECT_TRUE(StandardSchemaNamespace(kStandardSchema_dc).empty());
  EXPECT_TRUE(CommonSchemaDefinitions().empty());
  since.ExpectNone();
}

TEST_F(Registry, DuplicateTypeIsReportedAndTheFirstKept) {
  const auto first = NewType("rType");
  EXPECT_TRUE(RegisterTypeDefinition(first, kSource));
  EXPECT_EQ(first->type, Text("rType"));
  ErrorsSince since;
  EXPECT_FALSE(RegisterTypeDefinition(NewType("rType"), kSource));
  EXPECT_EQ(TypeIdDefinition("rType"), first);
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "type definition for \"rType\" already exists."});
  EXPECT_FALSE(RegisterTypeDefinition(TypeDefinitionPtr(), kSource));
}

TEST_F(Registry, ArrayTypeWithoutElementTypeBecomesText) {
  ErrorsSince since;
  const auto list = NewType("myList", kPrimitiveType_bag);
  EXPECT_TRUE(RegisterTypeDefinition(list, kSource));
  EXPECT_EQ(list->constraints.elementType, Text("text"));
  // Structs are left alone even when they extend an array kind.
  const auto structType = NewType("myStructList", kPrimitiveType_seq);
  structType->fields.push_back(NewField("f", "http://example.com/rf/", "rf", std::string("text")));
  EXPECT_TRUE(RegisterTypeDefinition(structType, kSource));
  EXPECT_FALSE(structType->constraints.elementType);
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "invalid element type for type \"myList\" is changed to default type 'text'."});
}

TEST_F(Registry, FieldsAreRepairedAndTheirNamespacesRegistered) {
  ErrorsSince since;
  const auto type = NewType("rStruct");
  type->fields.push_back(NewField("untyped", "http://example.com/rfield/", "rfield", boost::none));
  type->fields.push_back(NewField("list", "http://example.com/rfield/", "rfield", std::string("bag")));
  EXPECT_TRUE(RegisterTypeDefinition(type, kSource));
  EXPECT_EQ(type->fields[0]->type, Text("text"));
  EXPECT_EQ(type->fields[1]->constraints.elementType, Text("text"));
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "invalid type for XMP property \"rfield:untyped\" is changed to default type 'text'.",
                kRegistering + "invalid element type for XMP property \"rfield:list\" is changed to default "
                               "type 'text'."});
}

TEST_F(Registry, TypeWhoseFieldNamespaceFailsIsRemovedAgain) {
  ErrorsSince since;
  const auto type = NewType("rBroken");
  type->fields.push_back(NewField("good", "http://example.com/rgood/", "rgood", std::string("text")));
  type->fields.push_back(NewField("bad", "", "rbad", std::string("text")));
  type->fields.push_back(NewField("bad2", "http://example.com/rbad2/", "2bad", std::string("text")));
  EXPECT_FALSE(RegisterTypeDefinition(type, kSource));
  EXPECT_FALSE(TypeIdDefinition("rBroken"));
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "namespace \"\" couldn't be registered with prefix \"rbad\".",
                kRegistering + "namespace \"http://example.com/rbad2/\" couldn't be registered with prefix \"2bad\".",
                kRegistering + "invalid Type \"rBroken\"."});
}

TEST_F(Registry, DuplicateSchemaIsReportedOrMerged) {
  const std::string ns = "http://example.com/rdup/";
  const auto first = NewSchema(ns, "rdup", {NewProperty("a", std::string("text"))});
  EXPECT_TRUE(RegisterSchemaDefinition(first, kSource, false));
  EXPECT_TRUE(IsSchemaDefinitionAlreadyRegistered(NewSchema(ns, "other")));

  ErrorsSince since;
  EXPECT_FALSE(RegisterSchemaDefinition(NewSchema(ns, "rdup", {NewProperty("b", std::string("text"))}),
                                        kSource, false));
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "schema definition for \"http://example.com/rdup/\" already exists."});
  EXPECT_EQ(first->properties.size(), 1u);

  ErrorsSince mergeErrors;
  const auto extra =
      NewSchema(ns, "rdup", {NewProperty("a", std::string("integer")), NewProperty("c", boost::none)});
  // False although "c" merged: the merged schema is not a new one.
  EXPECT_FALSE(RegisterSchemaDefinition(extra, u"/defs/extension.xml", true));
  EXPECT_EQ(NamespaceDefinition(ns), first);
  ASSERT_EQ(first->properties.size(), 2u);
  EXPECT_EQ(first->properties[0]->type, Text("text"));
  EXPECT_EQ(first->properties[1]->name, "c");
  EXPECT_EQ(first->properties[1]->type, Text("text"));
  mergeErrors.Expect(
      kDefinitionRegistrationError, u"/defs/extension.xml",
      {kRegistering + "property definition for namespace \"http://example.com/rdup/a\" already exists.",
       kRegistering + "invalid type for XMP property \"rdup:c\" is changed to default type 'text'."});
}

TEST_F(Registry, TakenPrefixIsReportedButTheSchemaStays) {
  EXPECT_TRUE(RegisterSchemaDefinition(NewSchema("http://example.com/rtaken1/", "rtaken"), kSource, false));
  ErrorsSince since;
  const auto second = NewSchema("http://example.com/rtaken2/", "rtaken");
  EXPECT_TRUE(RegisterSchemaDefinition(second, kSource, false));
  EXPECT_EQ(NamespaceDefinition("http://example.com/rtaken2/"), second);
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "namespace \"http://example.com/rtaken2/\" couldn't be registered with prefix "
                               "\"rtaken\"."});
}

TEST_F(Registry, PropertiesWithoutTypeOrElementTypeAreRepaired) {
  ErrorsSince since;
  const auto schema = NewSchema("http://example.com/rfix/", "rfix",
                                {NewProperty("plain", boost::none), NewProperty("tags", std::string("bag")),
                                 NewProperty("ids", std::string("seq"), std::string("integer")),
                                 NewProperty("list", std::string("myFixList"))});
  RegisterTypeDefinition(NewType("myFixList", kPrimitiveType_seq, std::string("real")), kSource);
  EXPECT_TRUE(RegisterSchemaDefinition(schema, kSource, false));
  EXPECT_EQ(schema->properties[0]->type, Text("text"));
  EXPECT_EQ(schema->properties[1]->constraints.elementType, Text("text"));
  EXPECT_EQ(schema->properties[2]->constraints.elementType, Text("integer"));
  // The registered type carries the element type; the property needs none.
  EXPECT_FALSE(schema->properties[3]->constraints.elementType);
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "invalid type for XMP property \"rfix:plain\" is changed to default type 'text'.",
                kRegistering + "invalid element type for XMP property \"rfix:tags\" is changed to default "
                               "type 'text'."});
}

TEST_F(Registry, RemovalGoesByKeyAndLookupFindsTheFirstOfAName) {
  const auto registered = NewType("rRemovable");
  ASSERT_TRUE(RegisterTypeDefinition(registered, kSource));
  EXPECT_TRUE(RemoveTypeDefinition(NewType("rRemovable")));
  EXPECT_FALSE(TypeIdDefinition("rRemovable"));
  EXPECT_FALSE(RemoveTypeDefinition(registered));
  EXPECT_FALSE(RemoveTypeDefinition(TypeDefinitionPtr()));

  const auto first = NewProperty("dup", std::string("text"));
  const auto schema = NewSchema("http://example.com/rremove/", "rremove",
                                {NewProperty("a", std::string("text")), first,
                                 NewProperty("dup", std::string("integer"))});
  EXPECT_EQ(PropertyNameDefinition(schema, "dup"), first);
  EXPECT_FALSE(PropertyNameDefinition(schema, "missing"));
  EXPECT_FALSE(PropertyNameDefinition(SchemaDefinitionPtr(), "a"));
  ASSERT_TRUE(RegisterSchemaDefinition(schema, kSource, false));
  EXPECT_TRUE(RemoveSchemaDefinition(NewSchema("http://example.com/rremove/", "x")));
  EXPECT_FALSE(NamespaceDefinition("http://example.com/rremove/"));
  EXPECT_FALSE(RemoveSchemaDefinition(schema));
  // The namespace stays known to the toolkit: registering again works.
  EXPECT_TRUE(RegisterSchemaDefinition(schema, kSource, false));
}

TEST_F(Registry, ChecksReportUnknownTypesAndChangeNothing) {
  ErrorsSince since;
  const std::vector<SchemaDefinitionPtr> schemas = {
      NewSchema("http://example.com/rcheck/", "rcheck",
                {NewProperty("ok", std::string("text")), NewProperty("odd", std::string("noSuchType")),
                 NewProperty("list", std::string("seq"), std::string("noSuchElement")),
                 NewProperty("untyped", boost::none)})};
  EXPECT_TRUE(CheckPropertyTypes(schemas, kSource));
  const auto structType = NewType("rCheckStruct");
  structType->fields.push_back(NewField("f", "http://example.com/rcheckf/", "rcf", std::string("missingFieldType")));
  EXPECT_TRUE(CheckFieldTypes({structType, NewType("rCheckList", kPrimitiveType_alt, std::string("missingElement")),
                               NewType("rCheckFine", kPrimitiveType_alt, std::string("integer"))},
                              kSource));
  since.Expect(kDefinitionRegistrationError, kSource,
               {kRegistering + "XMP property \"rcheck:odd\" has an invalid type \"noSuchType\".",
                kRegistering + "XMP property \"rcheck:list\" has an invalid element type \"noSuchElement\".",
                kRegistering + "XMP property \"rcf:f\" has an invalid type \"missingFieldType\".",
                kRegistering + "XMP type \"rCheckList\" has an invalid element type \"missingElement\"."});
  EXPECT_FALSE(schemas[0]->properties[3]->type);
}

TEST(DynamicNamespaces, AreFormedAndRecognised) {
  const std::string clips = MakeDynamicSchemaNamespace("/clips/");
  EXPECT_EQ(clips, MakeDynamicSchemaNamespace("clips"));
  EXPECT_EQ(clips, "http://ns.ovrametadata.org/ovra/dynamic/clips/1.0/");
  EXPECT_EQ(MakeDynamicSchemaNamespace("a/b"), "http://ns.ovrametadata.org/ovra/dynamic/a/b/1.0/");
  EXPECT_TRUE(IsDynamicNamespace(clips));
  EXPECT_TRUE(IsDynamicNamespace("urn:x:http://ns.ovrametadata.org/ovra/dynamic/zz"));
  EXPECT_FALSE(IsDynamicNamespace("http://ns.ovrametadata.org/ovra/"));
}

TEST_F(Registry, SourceFilesAreLookedUpByExactPath) {
  const auto a = NewSchema("http://example.com/rsrc-a/", "rsa");
  const auto b = NewSchema("http://example.com/rsrc-b/", "rsb");
  SetFilePathForSchema(u"/defs/One.xml", a);
  SetFilePathForSchema(u"/defs/One.xml", b);
  SetFilePathForSchema(u"/defs/Two.xml", b);  // replaces
  EXPECT_EQ(ovratest::U8(filePathForSchema(b)), "/defs/Two.xml");
  EXPECT_TRUE(filePathForSchema(NewSchema("http://example.com/rsrc-a/", "rsa")).empty());
  EXPECT_EQ(allSchemasFromSourceFile(u"/defs/One.xml"), std::vector<SchemaDefinitionPtr>{a});
  EXPECT_TRUE(allSchemasFromSourceFile(u"/defs/one.xml").empty());
  EXPECT_TRUE(allTypesFromSourceFile(u"/defs/One.xml").empty());
}

TEST_F(Registry, TypeIdQueriesConsultRegisteredTypes) {
  const struct {
    const char* name;
    PrimitiveType extends;
    const char* elementType;
  } types[] = {
      {"rRating", kPrimitiveType_integer, nullptr},
      {"rMode", kPrimitiveType_closedchoice, "rRating"},
      {"rNested", kPrimitiveType_openchoice, "bag"},
      {"rKeywords", kPrimitiveType_bag, "rRating"},
      // Choices naming each other must not recurse for ever.
      {"rCycleA", kPrimitiveType_openchoice, "rCycleB"},
      {"rCycleB", kPrimitiveType_openchoice, "rCycleA"},
  };
  for (const auto& t : types)
    ASSERT_TRUE(RegisterTypeDefinition(NewType(t.name, t.extends, t.elementType ? Text(t.elementType) : Text()),
                                       kSource));

  EXPECT_EQ(PrimitiveTypeOf("rMode"), boost::make_optional(kPrimitiveType_closedchoice));
  EXPECT_TRUE(IsSimpleType("rRating"));
  EXPECT_TRUE(IsSimpleType("rMode"));
  EXPECT_FALSE(IsSimpleType("rNested"));
  EXPECT_FALSE(IsSimpleType("rCycleA"));
  EXPECT_FALSE(IsSimpleType("rKeywords"));
  EXPECT_TRUE(IsArrayType("rKeywords"));
  EXPECT_TRUE(IsStructType("noSuchType"));
  EXPECT_FALSE(IsStructType("rKeywords"));
  EXPECT_EQ(ElementTypeIdOf("rKeywords"), Text("rRating"));
  EXPECT_FALSE(ElementTypeIdOf("rRating"));
  EXPECT_FALSE(ElementTypeIdOf("noSuchType"));

  EXPECT_TRUE(IsElementExtensionOfSimpleScalar("rRating"));
  EXPECT_FALSE(IsElementExtensionOfSimpleScalar("rMode"));
  EXPECT_TRUE(DoesElementConformToContainer("rRating"));
  EXPECT_FALSE(DoesElementConformToContainer("rKeywords"));
  // Dates extend text yet are never elements of choices or alternatives.
  ASSERT_TRUE(TypeIdDefinition("date"));
  EXPECT_TRUE(IsElementExtensionOfSimpleScalar("date"));
  EXPECT_FALSE(DoesElementConformToContainer("date"));

  // Arrays of structs find their struct through the element type.
  const auto point = NewType("rPoint");
  point->fields.push_back(NewField("x", "http://example.com/rpoint/", "rpt", std::string("real")));
  ASSERT_TRUE(RegisterTypeDefinition(point, kSource));
  EXPECT_EQ(PropertyTypeOf(*NewProperty("path", std::string("seq"), std::string("rPoint"))), point);
  EXPECT_EQ(PropertyTypeOf(*NewProperty("origin", std::string("rPoint"))), point);
  EXPECT_FALSE(PropertyTypeOf(*NewProperty("none", boost::none)));
}

}  // namespace
