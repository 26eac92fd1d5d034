// The built-in definitions resources: they load cleanly and say what the
// published schemas say about the properties real files carry.
#include <map>
#include <set>
#include <string>
#include <vector>

#include "InitializeInternal.h"
#include "SrcTestSupport.h"

using namespace ovrametadata;
using ovratest::U16;
using ovratest::U8;

namespace {

const char* const kDC = "http://purl.org/dc/elements/1.1/";
const char* const kXMP = "http://ns.adobe.com/xap/1.0/";
const char* const kRights = "http://ns.adobe.com/xap/1.0/rights/";
const char* const kMM = "http://ns.adobe.com/xap/1.0/mm/";
const char* const kDM = "http://ns.adobe.com/xmp/1.0/DynamicMedia/";
const char* const kImageEditing = "http://ns.adobe.com/photoshop/1.0/";
const char* const kRawSettings = "http://ns.adobe.com/camera-raw-settings/1.0/";
const char* const kExif = "http://ns.adobe.com/exif/1.0/";
const char* const kExifEX = "http://cipa.jp/exif/1.0/";
const char* const kAux = "http://ns.adobe.com/exif/1.0/aux/";
const char* const kTiff = "http://ns.adobe.com/tiff/1.0/";
const char* const kIptcCore = "http://iptc.org/std/Iptc4xmpCore/1.0/xmlns/";
const char* const kIptcExt = "http://iptc.org/std/Iptc4xmpExt/2008-02-29/";
const char* const kPlus = "http://ns.useplus.org/ldf/xmp/1.0/";
const char* const kAggregate = "http://ns.ovrametadata.org/xmp/aggregate/1.0/";
const char* const kSWF = "http://ns.ovrametadata.org/swf/1.0/";
const char* const kDICOM = "http://ns.ovrametadata.org/DICOM/";
const char* const kLabelKeyStart = "$$$/ovrametadata/schema/";

// The namespace each standard schema resource must declare, by enumerator.
const char* const kStandardNamespaces[kStandardSchemaCount] = {
    kDC,
    kXMP,
    kRights,
    kMM,
    "http://ns.adobe.com/xap/1.0/bj/",
    "http://ns.adobe.com/xap/1.0/t/pg/",
    kDM,
    "http://ns.ovrametadata.org/xmp/assignment/1.0/",
    "http://ns.ovrametadata.org/xmp/memo/1.0/",
    "http://ns.adobe.com/pdf/1.3/",
    kImageEditing,
    kRawSettings,
    kExif,
    kExifEX,
    kTiff,
    "http://ns.ovrametadata.org/xmp/contentanalysis/1.0/",
    "http://ns.adobe.com/xmp/1.0/Script/",
    "http://ns.adobe.com/bwf/bext/1.0/",
    kIptcCore,
    kIptcExt,
    kDICOM,
    kPlus,
    "http://ns.ovrametadata.org/xmp/mobile/1.0/",
    "http://ns.ovrametadata.org/as11/core/1.0/",
    "http://ns.ovrametadata.org/as11/ukdpp/1.0/",
    "http://ns.ovrametadata.org/as11/structural/1.0/",
    "http://ns.adobe.com/ixml/1.0/",
    "http://ns.ovrametadata.org/xmp/editlist/1.0/",
};

PropertyDefinitionPtr Property(const char* namespaceURI, const char* name) {
  return PropertyNameDefinition(NamespaceDefinition(namespaceURI), name);
}

// What a definitions resource declares, read again without registering.
DefinitionsPair ParseResource(const std::string& title) {
  const auto contents = ovrametadataResources().Read(title, "xml");
  if (!contents) return DefinitionsPair();
  return ParseBufferForDefinitions(UTF8String(*contents), U16(title));
}

std::vector<std::string> BuiltinResourceTitles() {
  std::vector<std::string> titles = {"primitive_type_definitions", "constructed_type_definitions",
                                     "aux_definitions", "orlex_definitions"};
  for (int index = 0; index < kStandardSchemaCount; ++index)
    titles.push_back(StandardSchemaStem(static_cast<StandardSchema>(index)) + "_definitions");
  return titles;
}

// The registered definitions of every schema and type the resources declare.
struct Registered {
  std::vector<SchemaDefinitionPtr> schemas;
  std::vector<TypeDefinitionPtr> types;
};

Registered AllRegisteredBuiltins() {
  Registered all;
  for (const auto& title : BuiltinResourceTitles()) {
    const DefinitionsPair declared = ParseResource(title);
    EXPECT_FALSE(declared.first.empty() && declared.second.empty()) << title << " is missing or empty";
    for (const auto& schema : declared.first)
      all.schemas.push_back(NamespaceDefinition(schema->namespaceURI));
    for (const auto& type : declared.second) all.types.push_back(TypeIdDefinition(type->name));
  }
  return all;
}

TEST(BuiltinDefinitions, StartUpLoadsEveryResourceWithoutAnyReport) {
  ovratest::ErrorsSince errors;
  ovratest::LibraryScope library;
  EXPECT_TRUE(errors.New().empty()) << ::testing::PrintToString(errors.Texts());

  for (int index = 0; index < kStandardSchemaCount; ++index) {
    const auto standard = static_cast<StandardSchema>(index);
    SCOPED_TRACE(StandardSchemaStem(standard));
    EXPECT_EQ(StandardSchemaNamespace(standard), kStandardNamespaces[index]);
    const SchemaDefinitionPtr schema = NamespaceDefinition(kStandardNamespaces[index]);
    ASSERT_TRUE(schema);
    EXPECT_FALSE(schema->isCustom);
    EXPECT_FALSE(schema->isDynamic);
    EXPECT_FALSE(schema->properties.empty());
  }
  // The maker's schemas come from the base resources and are not standard.
  for (const char* namespaceURI : {kAux, kAggregate, kSWF})
    EXPECT_TRUE(NamespaceDefinition(namespaceURI)) << namespaceURI;

  std::set<std::string> common;
  for (const auto& schema : CommonSchemaDefinitions()) common.insert(schema->namespaceURI);
  EXPECT_EQ(common.size(), static_cast<std::size_t>(kStandardSchemaCount));
  for (const char* namespaceURI : kStandardNamespaces) EXPECT_EQ(common.count(namespaceURI), 1u);
  EXPECT_TRUE(DynamicSchemaDefinitions().empty());
}

TEST(BuiltinDefinitions, TypeChecksFindNothingAndEveryDeclarationIsRegistered) {
  ovratest::LibraryScope library;
  const Registered all = AllRegisteredBuiltins();
  for (const auto& schema : all.schemas) ASSERT_TRUE(schema);
  for (const auto& type : all.types) ASSERT_TRUE(type);
  EXPECT_GE(all.types.size(), 9u + 40u);

  ovratest::ErrorsSince errors;
  EXPECT_TRUE(CheckPropertyTypes(all.schemas, u"builtin"));
  EXPECT_TRUE(CheckFieldTypes(all.types, u"builtin"));
  EXPECT_TRUE(errors.New().empty()) << ::testing::PrintToString(errors.Texts());

  // Every array and choice names the type of its elements, so nothing falls
  // back to text by accident, and every struct field lives in a namespace.
  for (const auto& schema : all.schemas) {
    for (const auto& property : schema->properties) {
      SCOPED_TRACE(schema->prefix + ":" + property->name);
      const auto kind = PrimitiveTypeOf(*property);
      if (kind && (PrimitiveTypeIsArray(*kind) || PrimitiveTypeIsChoice(*kind))) {
        EXPECT_TRUE(ElementTypeIdOf(*property));
      }
      if (property->type && !PrimitiveTypeIdAsPrimitiveType(*property->type)) {
        EXPECT_TRUE(TypeIdDefinition(*property->type));
      }
    }
  }
  for (const auto& type : all.types) {
    for (const auto& field : type->fields) {
      SCOPED_TRACE(type->name + "/" + field->name);
      EXPECT_FALSE(field->namespaceURI.empty());
      EXPECT_FALSE(field->prefix.empty());
      EXPECT_TRUE(field->type);
    }
  }
}

TEST(BuiltinDefinitions, LabelsAreLocalisationKeysWithEnglishDefaults) {
  ovratest::LibraryScope library;
  const Registered all = AllRegisteredBuiltins();
  auto expectKeyed = [](const LocalizedDefinition& entry, const std::string& what) {
    SCOPED_TRACE(what);
    EXPECT_EQ(U8(entry.labelSource).rfind(kLabelKeyStart, 0), 0u) << U8(entry.labelSource);
    // The localiser without a dictionary shows the text after the key.
    EXPECT_FALSE(entry.label.empty());
    EXPECT_EQ(U8(entry.label).find("$$$"), std::string::npos);
    if (!entry.descriptionSource.empty()) {
      EXPECT_EQ(U8(entry.description).find("$$$"), std::string::npos);
    }
  };
  auto expectChoices = [](const EntryDefinition& entry, const std::string& what) {
    for (const auto& choice : entry.constraints.choices) {
      SCOPED_TRACE(what + "=" + choice->rawValue);
      EXPECT_EQ(U8(choice->labelSource).rfind(kLabelKeyStart, 0), 0u);
      EXPECT_FALSE(choice->label.empty());
      EXPECT_EQ(U8(choice->label).find("$$$"), std::string::npos);
    }
  };
  for (const auto& schema : all.schemas) {
    expectKeyed(*schema, schema->namespaceURI);
    for (const auto& property : schema->properties) {
      expectKeyed(*property, schema->prefix + ":" + property->name);
      expectChoices(*property, schema->prefix + ":" + property->name);
    }
  }
  for (const auto& type : all.types) {
    expectKeyed(*type, type->name);
    for (const auto& field : type->fields) {
      expectKeyed(*field, type->name + "/" + field->name);
      expectChoices(*field, type->name + "/" + field->name);
    }
  }
}

struct Expected {
  const char* namespaceURI;
  const char* name;
  const char* type;         // the property's type id
  const char* elementType;  // "" when the property has none
  const char* kind;         // primitive type id, or "" for a struct
  bool internal;
};

// Properties as real files carry them, and what their published schemas say.
const Expected kRealWorld[] = {
    {kDC, "title", "alt", "text", "alt", false},
    {kDC, "description", "alt", "text", "alt", false},
    {kDC, "rights", "alt", "text", "alt", false},
    {kDC, "subject", "bag", "text", "bag", false},
    {kDC, "creator", "seq", "propername", "seq", false},
    {kDC, "date", "seq", "date", "seq", false},
    {kXMP, "Rating", "closedchoice", "real", "closedchoice", false},
    {kXMP, "CreateDate", "date", "", "text", false},
    {kXMP, "MetadataDate", "date", "", "text", true},
    {kXMP, "Thumbnails", "alt", "Thumbnail", "alt", true},
    {kRights, "Marked", "boolean", "", "boolean", false},
    {kRights, "WebStatement", "url", "", "text", false},
    {kMM, "History", "seq", "ResourceEvent", "seq", true},
    {kMM, "DerivedFrom", "ResourceRef", "", "", true},
    {kExif, "ExposureTime", "rational", "", "text", true},
    {kExif, "FNumber", "rational", "", "text", true},
    {kExif, "ShutterSpeedValue", "rational", "", "text", true},
    {kExif, "ApertureValue", "rational", "", "text", true},
    {kExif, "MaxApertureValue", "rational", "", "text", true},
    {kExif, "SubjectDistance", "rational", "", "text", true},
    {kExif, "ISOSpeedRatings", "seq", "integer", "seq", true},
    {kExif, "GPSLatitude", "gpscoordinate", "", "text", true},
    {kExif, "GPSLongitude", "gpscoordinate", "", "text", true},
    {kExif, "GPSHPositioningError", "rational", "", "text", true},
    {kExif, "DateTimeOriginal", "date", "", "text", true},
    {kExif, "PixelXDimension", "integer", "", "integer", true},
    {kExif, "Flash", "Flash", "", "", true},
    {kExif, "MeteringMode", "closedchoice", "integer", "closedchoice", true},
    {kExifEX, "PhotographicSensitivity", "integer", "", "integer", true},
    {kExifEX, "SensitivityType", "closedchoice", "integer", "closedchoice", true},
    {kExifEX, "LensModel", "text", "", "text", true},
    {kAux, "Lens", "text", "", "text", true},
    {kAux, "ApproximateFocusDistance", "rational", "", "text", true},
    {kTiff, "Orientation", "closedchoice", "integer", "closedchoice", true},
    {kTiff, "XResolution", "rational", "", "text", true},
    {kTiff, "ImageWidth", "integer", "", "integer", true},
    {kIptcCore, "CreatorContactInfo", "ContactInfo", "", "", false},
    {kIptcCore, "Scene", "bag", "text", "bag", false},
    {kIptcExt, "LocationShown", "bag", "LocationDetails", "bag", false},
    {kIptcExt, "PersonInImageWDetails", "bag", "PersonDetails", "bag", false},
    {kImageEditing, "City", "text", "", "text", false},
    {kImageEditing, "Headline", "text", "", "text", false},
    {kImageEditing, "DateCreated", "date", "", "text", false},
    {kImageEditing, "ColorMode", "closedchoice", "integer", "closedchoice", true},
    {kDM, "duration", "Time", "", "", true},
    {kDM, "markers", "seq", "Marker", "seq", false},
    {kDM, "startTimecode", "Timecode", "", "", true},
    {kDM, "audioChannelType", "closedchoice", "text", "closedchoice", true},
    {kDM, "videoFrameSize", "Dimensions", "", "", true},
    {kDM, "logComment", "text", "", "text", false},
    {kPlus, "Licensee", "seq", "Licensee", "seq", false},
    {kPlus, "CopyrightOwner", "seq", "CopyrightOwner", "seq", false},
    {kRawSettings, "ToneCurve", "seq", "text", "seq", true},
    {kAggregate, "ImageSize", "text", "", "text", true},
    {kAggregate, "PhotographicSensitivity", "text", "", "text", true},
};

TEST(BuiltinDefinitions, RealWorldPropertiesHaveTheirPublishedTypes) {
  ovratest::LibraryScope library;
  for (const auto& row : kRealWorld) {
    SCOPED_TRACE(std::string(row.namespaceURI) + row.name);
    const PropertyDefinitionPtr property = Property(row.namespaceURI, row.name);
    ASSERT_TRUE(property);
    EXPECT_EQ(property->type, boost::make_optional(UTF8String(row.type)));
    EXPECT_EQ(property->isInternal, row.internal);

    const auto kind = PrimitiveTypeOf(*property);
    if (*row.kind) {
      EXPECT_EQ(kind, PrimitiveTypeIdAsPrimitiveType(row.kind));
    } else {
      EXPECT_FALSE(kind);
      EXPECT_TRUE(IsStructType(row.type));
    }

    const auto element = ElementTypeIdOf(*property);
    if (*row.elementType) {
      EXPECT_EQ(element, boost::make_optional(UTF8String(row.elementType)));
    } else {
      EXPECT_FALSE(element);
    }

    // Arrays of structs and structs find their struct definition; the rest
    // find the registered type of their value or element type.
    const TypeDefinitionPtr valueType = PropertyTypeOf(*property);
    ASSERT_TRUE(valueType);
    EXPECT_EQ(valueType->name, *row.elementType ? row.elementType : row.type);
  }
}

std::map<std::string, FieldDefinition> FieldsOf(const TypeDefinitionPtr& type) {
  std::map<std::string, FieldDefinition> fields;
  if (type)
    for (const auto& field : type->fields) fields[field->name] = *field;
  return fields;
}

TEST(BuiltinDefinitions, StructPropertiesCarryTheirFieldsInTheirNamespaces) {
  ovratest::LibraryScope library;

  auto contact = FieldsOf(PropertyTypeOf(*Property(kIptcCore, "CreatorContactInfo")));
  for (const char* name : {"CiAdrExtadr", "CiAdrCity", "CiAdrRegion", "CiAdrPcode", "CiAdrCtry",
                           "CiTelWork", "CiEmailWork", "CiUrlWork"}) {
    ASSERT_EQ(contact.count(name), 1u) << name;
    EXPECT_EQ(contact[name].namespaceURI, kIptcCore);
    EXPECT_EQ(contact[name].prefix, "Iptc4xmpCore");
    EXPECT_EQ(contact[name].type, boost::make_optional(UTF8String("text")));
  }

  auto time = FieldsOf(PropertyTypeOf(*Property(kDM, "duration")));
  ASSERT_EQ(time.size(), 2u);
  EXPECT_EQ(time["value"].type, boost::make_optional(UTF8String("integer")));
  EXPECT_EQ(time["scale"].type, boost::make_optional(UTF8String("rational")));
  EXPECT_EQ(time["scale"].namespaceURI, kDM);

  auto marker = FieldsOf(PropertyTypeOf(*Property(kDM, "markers")));
  for (const char* name : {"startTime", "duration", "comment", "name", "type", "cuePointParams"})
    EXPECT_EQ(marker.count(name), 1u) << name;
  EXPECT_EQ(ElementTypeIdOf(marker["cuePointParams"]), boost::make_optional(UTF8String("CuePointParam")));

  auto licensee = FieldsOf(PropertyTypeOf(*Property(kPlus, "Licensee")));
  ASSERT_EQ(licensee.size(), 2u);
  EXPECT_EQ(licensee["LicenseeName"].namespaceURI, kPlus);
  EXPECT_EQ(licensee["LicenseeID"].prefix, "plus");

  // IPTC locations borrow the EXIF GPS fields.
  auto location = FieldsOf(PropertyTypeOf(*Property(kIptcExt, "LocationCreated")));
  EXPECT_EQ(location["City"].namespaceURI, kIptcExt);
  EXPECT_EQ(location["GPSLatitude"].namespaceURI, kExif);
  EXPECT_EQ(location["GPSLatitude"].type, boost::make_optional(UTF8String("gpscoordinate")));

  auto event = FieldsOf(PropertyTypeOf(*Property(kMM, "History")));
  EXPECT_EQ(event["when"].type, boost::make_optional(UTF8String("date")));
  EXPECT_EQ(event["action"].prefix, "stEvt");
  EXPECT_EQ(PrimitiveTypeOf(event["action"]), boost::make_optional(kPrimitiveType_openchoice));

  auto flash = FieldsOf(PropertyTypeOf(*Property(kExif, "Flash")));
  ASSERT_EQ(flash.size(), 5u);
  EXPECT_EQ(flash["Return"].namespaceURI, kExif);
  EXPECT_EQ(ElementTypeIdOf(flash["Mode"]), boost::make_optional(UTF8String("integer")));
  EXPECT_EQ(flash["Mode"].constraints.choices.size(), 4u);
  EXPECT_EQ(ElementTypeIdOf(flash["Fired"]), boost::make_optional(UTF8String("boolean")));
}

std::map<std::string, std::string> ChoiceLabels(const EntryDefinition& entry) {
  std::map<std::string, std::string> labels;
  for (const auto& choice : entry.constraints.choices) labels[choice->rawValue] = U8(choice->label);
  return labels;
}

TEST(BuiltinDefinitions, ClosedChoicesListTheStoredValuesWithReadableLabels) {
  ovratest::LibraryScope library;

  auto orientation = ChoiceLabels(*Property(kTiff, "Orientation"));
  ASSERT_EQ(orientation.size(), 8u);
  for (int value = 1; value <= 8; ++value) EXPECT_EQ(orientation.count(std::to_string(value)), 1u);
  EXPECT_EQ(orientation["1"], "Normal");
  EXPECT_EQ(orientation["6"], "Rotated 90 degrees clockwise");

  auto metering = ChoiceLabels(*Property(kExif, "MeteringMode"));
  EXPECT_EQ(metering["5"], "Pattern");
  EXPECT_EQ(metering.count("255"), 1u);

  auto program = ChoiceLabels(*Property(kExif, "ExposureProgram"));
  EXPECT_EQ(program.size(), 9u);
  EXPECT_EQ(program["3"], "Aperture priority");

  auto channels = ChoiceLabels(*Property(kDM, "audioChannelType"));
  for (const char* raw : {"Mono", "Stereo", "5.1", "7.1", "16 Channel", "Other"})
    EXPECT_EQ(channels.count(raw), 1u) << raw;

  auto rating = ChoiceLabels(*Property(kXMP, "Rating"));
  EXPECT_EQ(rating.size(), 7u);
  EXPECT_EQ(rating["-1"], "Rejected");

  // A choice kind whose values may be shown in a picker must conform.
  EXPECT_TRUE(DoesElementConformToContainer(*ElementTypeIdOf(*Property(kTiff, "Orientation"))));
  EXPECT_TRUE(DoesElementConformToContainer(*ElementTypeIdOf(*Property(kDC, "title"))));
}

TEST(BuiltinDefinitions, FormattedAndAggregatedPathsAreDefinedForTheFormatters) {
  ovratest::LibraryScope library;
  // The display formatters apply to internal properties and dispatch on
  // the type id, so these must be internal and typed as the values are.
  const std::pair<const char*, const char*> rationals[] = {
      {kExif, "ExposureTime"},     {kExif, "ShutterSpeedValue"},
      {kExif, "FNumber"},          {kExif, "ApertureValue"},
      {kExif, "MaxApertureValue"}, {kExif, "SubjectDistance"},
      {kExif, "FocalLength"},      {kAux, "ApproximateFocusDistance"},
      {kTiff, "XResolution"},      {kTiff, "YResolution"},
      {kExifEX, "GPSHPositioningError"}};
  for (const auto& path : rationals) {
    const auto property = Property(path.first, path.second);
    ASSERT_TRUE(property) << path.second;
    EXPECT_EQ(property->type, boost::make_optional(UTF8String("rational"))) << path.second;
    EXPECT_TRUE(property->isInternal) << path.second;
  }
  // Fallbacks read these; aggregators read the rest.
  const std::pair<const char*, const char*> read[] = {
      {kExifEX, "LensModel"},         {kAux, "Lens"},
      {kExifEX, "BodySerialNumber"},  {kAux, "SerialNumber"},
      {kExifEX, "LensSerialNumber"},  {kAux, "LensSerialNumber"},
      {kExifEX, "CameraOwnerName"},   {kAux, "OwnerName"},
      {kExifEX, "SensitivityType"},   {kExif, "PixelYDimension"},
      {kTiff, "ImageLength"},         {kAggregate, "ImageResolution"},
      {kAggregate, "ShutterSpeed"}};
  for (const auto& path : read) {
    const auto property = Property(path.first, path.second);
    ASSERT_TRUE(property) << path.second;
    EXPECT_TRUE(property->isInternal) << path.second;
  }
  // The converter's tone curve is what the built-in block list names.
  EXPECT_TRUE(Property(StandardSchemaNamespace(kStandardSchema_rwset).c_str(), "ToneCurve"));
}

}  // namespace
