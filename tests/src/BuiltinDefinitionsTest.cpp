// The built-in definitions resources: they load cleanly and say what the
// published schemas say about the properties real files carry.
#include <map>
#include <iterator>
#include <set>
#include <string>
#include <vector>

#include <ovracore/Diagnostics.h>

#include "InitializeInternal.h"
#include "MetadataTestSupport.h"

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
    kDC, kXMP, kRights, kMM, "http://ns.adobe.com/xap/1.0/bj/", "http://ns.adobe.com/xap/1.0/t/pg/", kDM,
    "http://ns.ovrametadata.org/xmp/assignment/1.0/", "http://ns.ovrametadata.org/xmp/memo/1.0/",
    "http://ns.adobe.com/pdf/1.3/", kImageEditing, kRawSettings, kExif, kExifEX, kTiff,
    "http://ns.ovrametadata.org/xmp/contentanalysis/1.0/", "http://ns.adobe.com/xmp/1.0/Script/",
    "http://ns.adobe.com/bwf/bext/1.0/", kIptcCore, kIptcExt, kDICOM, kPlus,
    "http://ns.ovrametadata.org/xmp/mobile/1.0/", "http://ns.ovrametadata.org/as11/core/1.0/",
    "http://ns.ovrametadata.org/as11/ukdpp/1.0/", "http://ns.ovrametadata.org/as11/structural/1.0/",
    "http://ns.adobe.com/ixml/1.0/", "http://ns.ovrametadata.org/xmp/editlist/1.0/",
};

PropertyDefinitionPtr Property(const char* namespaceURI, const char* name) {
  return PropertyNameDefinition(NamespaceDefinition(namespaceURI), name);
}

// The registered definitions of every schema and type the built-in
// resources declare (read again without registering).
struct Registered {
  std::vector<SchemaDefinitionPtr> schemas;
  std::vector<TypeDefinitionPtr> types;
};

Registered AllRegisteredBuiltins() {
  std::vector<std::string> titles = {"primitive_type_definitions", "constructed_type_definitions",
                                     "aux_definitions", "orlex_definitions"};
  for (int index = 0; index < kStandardSchemaCount; ++index)
    titles.push_back(StandardSchemaStem(static_cast<StandardSchema>(index)) + "_definitions");
  Registered all;
  for (const auto& title : titles) {
    const auto contents = ovrametadataResources().Read(title, "xml");
    const DefinitionsPair declared =
        contents ? ParseBufferForDefinitions(UTF8String(*contents), U16(title)) : DefinitionsPair();
    EXPECT_FALSE(declared.first.empty() && declared.second.empty()) << title << " is missing or empty";
    for (const auto& schema : declared.first) all.schemas.push_back(NamespaceDefinition(schema->namespaceURI));
    for (const auto& type : declared.second) all.types.push_back(TypeIdDefinition(type->name));
  }
  return all;
}

TEST(BuiltinDefinitions, StartUpLoadsEveryResourceWithoutAnyReport) {
  ovratest::ErrorsSince errors;
  ovratest::LibraryScope library;
  errors.ExpectNone();

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
  // The standard schemas and those real photo files carry besides.
  const char* const kCommonNamespaces[] = {"http://ns.adobe.com/lightroom/1.0/",
                                           "http://www.metadataworkinggroup.com/schemas/regions/",
                                           "http://www.metadataworkinggroup.com/schemas/keywords/",
                                           "http://ns.google.com/photos/1.0/panorama/"};
  EXPECT_EQ(common.size(), static_cast<std::size_t>(kStandardSchemaCount) + std::size(kCommonNamespaces));
  for (const char* namespaceURI : kStandardNamespaces) EXPECT_EQ(common.count(namespaceURI), 1u);
  for (const char* namespaceURI : kCommonNamespaces) {
    const SchemaDefinitionPtr schema = NamespaceDefinition(namespaceURI);
    ASSERT_TRUE(schema) << namespaceURI;
    EXPECT_FALSE(schema->isCustom);
  }
  EXPECT_TRUE(DynamicSchemaDefinitions().empty());

  std::set<std::string> marks;
  for (const auto& mark : ovracore::TimeMarks())
    if (mark.category == "StartupTime") marks.insert(mark.text);
  EXPECT_EQ(marks.count("Start Initializing ovrametadata"), 1u);
  EXPECT_EQ(marks.count("Finish Initializing ovrametadata"), 1u);
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
  errors.ExpectNone();

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
  auto expectLabel = [](const std::u16string& source, const std::u16string& label, const std::string& what) {
    SCOPED_TRACE(what);
    EXPECT_EQ(U8(source).rfind(kLabelKeyStart, 0), 0u) << U8(source);
    // The localiser without a dictionary shows the text after the key.
    EXPECT_FALSE(label.empty());
    EXPECT_EQ(U8(label).find("$$$"), std::string::npos);
  };
  auto expectKeyed = [&](const LocalizedDefinition& entry, const std::string& what) {
    expectLabel(entry.labelSource, entry.label, what);
    EXPECT_EQ(U8(entry.description).find("$$$"), std::string::npos) << what;
  };
  auto expectEntryKeyed = [&](const EntryDefinition& entry, const std::string& what) {
    expectKeyed(entry, what);
    for (const auto& choice : entry.constraints.choices)
      expectLabel(choice->labelSource, choice->label, what + "=" + choice->rawValue);
  };
  for (const auto& schema : all.schemas) {
    expectKeyed(*schema, schema->namespaceURI);
    for (const auto& property : schema->properties) expectEntryKeyed(*property, schema->prefix + ":" + property->name);
  }
  for (const auto& type : all.types) {
    expectKeyed(*type, type->name);
    for (const auto& field : type->fields) expectEntryKeyed(*field, type->name + "/" + field->name);
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
    // What the display formatters, fallbacks and aggregators read: they
    // apply to internal properties and dispatch on the type id.
    {kExif, "FocalLength", "rational", "", "text", true},
    {kTiff, "YResolution", "rational", "", "text", true},
    {kExifEX, "GPSHPositioningError", "rational", "", "text", true},
    {kExifEX, "BodySerialNumber", "text", "", "text", true},
    {kAux, "SerialNumber", "text", "", "text", true},
    {kExifEX, "LensSerialNumber", "text", "", "text", true},
    {kAux, "LensSerialNumber", "text", "", "text", true},
    {kExifEX, "CameraOwnerName", "text", "", "text", true},
    {kAux, "OwnerName", "text", "", "text", true},
    {kExif, "PixelYDimension", "integer", "", "integer", true},
    {kTiff, "ImageLength", "integer", "", "integer", true},
    {kAggregate, "ImageResolution", "text", "", "text", true},
    {kAggregate, "ShutterSpeed", "text", "", "text", true},
};

TEST(BuiltinDefinitions, RealWorldPropertiesAndTheirPathsHaveTheirPublishedTypes) {
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

    // The property's path resolves to the same definition and kind.
    const Path path = PathForSchemaNameAndPropertyName(row.namespaceURI, row.name);
    EXPECT_EQ(path.internal, row.internal);
    EXPECT_EQ(path.description, row.name);
    EXPECT_EQ(PathEntryDefinition(path), boost::shared_ptr<EntryDefinition>(property));
    EXPECT_EQ(PrimitiveTypeOfPath(path), kind);
  }
}

TEST(BuiltinDefinitions, StructPropertiesCarryTheirFieldsInTheirNamespaces) {
  ovratest::LibraryScope library;
  auto fieldsOf = [](const char* namespaceURI, const char* name) {
    std::map<std::string, FieldDefinition> fields;
    if (const auto type = PropertyTypeOf(*Property(namespaceURI, name)))
      for (const auto& field : type->fields) fields[field->name] = *field;
    return fields;
  };
  // Fields in the property's own namespace and prefix.
  const struct {
    const char* namespaceURI;
    const char* property;
    const char* prefix;
    std::size_t fieldCount;  // 0: not checked
    std::vector<const char*> fields;
  } structs[] = {
      {kIptcCore, "CreatorContactInfo", "Iptc4xmpCore", 0,
       {"CiAdrExtadr", "CiAdrCity", "CiAdrRegion", "CiAdrPcode", "CiAdrCtry", "CiTelWork", "CiEmailWork",
        "CiUrlWork"}},
      {kDM, "duration", "xmpDM", 2, {"value", "scale"}},
      {kDM, "markers", "xmpDM", 0, {"startTime", "duration", "comment", "name", "type", "cuePointParams"}},
      {kPlus, "Licensee", "plus", 2, {"LicenseeName", "LicenseeID"}},
      {kExif, "Flash", "exif", 5, {"Fired", "Return", "Mode", "Function", "RedEyeMode"}},
  };
  for (const auto& s : structs) {
    SCOPED_TRACE(s.property);
    const auto fields = fieldsOf(s.namespaceURI, s.property);
    if (s.fieldCount) {
      EXPECT_EQ(fields.size(), s.fieldCount);
    }
    for (const char* name : s.fields) {
      ASSERT_EQ(fields.count(name), 1u) << name;
      EXPECT_EQ(fields.at(name).namespaceURI, s.namespaceURI) << name;
      EXPECT_EQ(fields.at(name).prefix, s.prefix) << name;
    }
  }
  for (const auto& [name, field] : fieldsOf(kIptcCore, "CreatorContactInfo"))
    EXPECT_EQ(field.type, boost::make_optional(UTF8String("text"))) << name;
  // Field types, element types and prefixes, including IPTC locations that
  // borrow the EXIF GPS fields.
  const struct {
    const char* namespaceURI;
    const char* property;
    const char* field;
    const char* fieldNamespace;
    const char* prefix;  // null: not checked
    const char* type;
    const char* elementType;  // null: none
  } fields[] = {
      {kDM, "duration", "value", kDM, nullptr, "integer", nullptr},
      {kDM, "duration", "scale", kDM, nullptr, "rational", nullptr},
      {kDM, "markers", "cuePointParams", kDM, nullptr, "seq", "CuePointParam"},
      {kPlus, "Licensee", "LicenseeID", kPlus, "plus", "text", nullptr},
      {kIptcExt, "LocationCreated", "City", kIptcExt, nullptr, "text", nullptr},
      {kIptcExt, "LocationCreated", "GPSLatitude", kExif, nullptr, "gpscoordinate", nullptr},
      {kMM, "History", "when", nullptr, "stEvt", "date", nullptr},
      {kMM, "History", "action", nullptr, "stEvt", "openchoice", "text"},
      {kExif, "Flash", "Mode", kExif, nullptr, "closedchoice", "integer"},
      {kExif, "Flash", "Fired", kExif, nullptr, "closedchoice", "boolean"},
  };
  for (const auto& f : fields) {
    SCOPED_TRACE(std::string(f.property) + "/" + f.field);
    const auto all = fieldsOf(f.namespaceURI, f.property);
    ASSERT_EQ(all.count(f.field), 1u);
    const FieldDefinition& field = all.at(f.field);
    if (f.fieldNamespace) {
      EXPECT_EQ(field.namespaceURI, f.fieldNamespace);
    }
    if (f.prefix) {
      EXPECT_EQ(field.prefix, f.prefix);
    }
    EXPECT_EQ(field.type, boost::make_optional(UTF8String(f.type)));
    EXPECT_EQ(ElementTypeIdOf(field), f.elementType ? boost::make_optional(UTF8String(f.elementType))
                                                    : boost::optional<UTF8String>());
  }
  EXPECT_EQ(fieldsOf(kExif, "Flash")["Mode"].constraints.choices.size(), 4u);
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

}  // namespace
