// The definitions model: primitive types, their predicates, Date and the
// factories.
#include <iterator>
#include <string_view>
#include <tuple>

#include <ovrametadata/Definitions.h>

namespace ovrametadata {

namespace {

const std::string_view kPrimitiveTypeIds[] = {"integer",    "real",         "text",
                                         "boolean",    "openchoice",   "closedchoice",
                                         "bag",        "seq",          "alt"};

const char* const kStandardSchemaStems[] = {
    "dc",           "xmp",        "xmpRights",  "xmpMM",         "xmpBJ",     "xmpTPg",
    "xmpDM",        "xmpPMAssign", "xmpPMMemo", "pdf",           "pictora",   "rwset",
    "exif",         "exifEX",     "tiff",       "xmpCA",         "xmpScript", "bext",
    "iptcCore",     "iptcExtension", "dicom",   "plus",          "mobile",    "as11core",
    "as11ukdpp",    "as11structural", "iXML",   "zel"};
static_assert(std::size(kStandardSchemaStems) == kStandardSchemaCount);

bool IsChoiceOrArrayKind(boost::optional<PrimitiveType> const& type) {
  return type && (PrimitiveTypeIsChoice(*type) || PrimitiveTypeIsArray(*type));
}

}  // namespace

LocalizedDefinition::~LocalizedDefinition() = default;

UTF8String StandardSchemaStem(StandardSchema schema) {
  const auto index = static_cast<unsigned>(schema);
  return index < std::size(kStandardSchemaStems) ? kStandardSchemaStems[index] : "";
}

bool operator<(Date const& a, Date const& b) {
  return std::tie(a.year, a.month, a.day, a.hour, a.minute, a.second) <
         std::tie(b.year, b.month, b.day, b.hour, b.minute, b.second);
}

bool operator==(Date const& a, Date const& b) {
  return std::tie(a.year, a.month, a.day, a.hour, a.minute, a.second) ==
         std::tie(b.year, b.month, b.day, b.hour, b.minute, b.second);
}

UTF8String PrimitiveTypeAsPrimitiveTypeId(PrimitiveType type) {
  const auto index = static_cast<unsigned>(type);
  return index < std::size(kPrimitiveTypeIds) ? UTF8String(kPrimitiveTypeIds[index]) : "";
}

boost::optional<PrimitiveType> PrimitiveTypeIdAsPrimitiveType(UTF8String const& typeId) {
  static const PrimitiveType kOrder[] = {
      kPrimitiveType_integer,    kPrimitiveType_real,         kPrimitiveType_text,
      kPrimitiveType_boolean,    kPrimitiveType_openchoice,   kPrimitiveType_closedchoice,
      kPrimitiveType_bag,        kPrimitiveType_alt,          kPrimitiveType_seq};
  const std::string_view id = typeId;  // compares lengths before bytes
  for (PrimitiveType type : kOrder) {
    if (id == kPrimitiveTypeIds[type]) return type;
  }
  return boost::none;
}

bool PrimitiveTypeIsSimple(PrimitiveType type) {
  return type >= kPrimitiveType_integer && type <= kPrimitiveType_boolean;
}

bool IsTypeSimpleScalar(PrimitiveType type) { return PrimitiveTypeIsSimple(type); }

bool PrimitiveTypeIsChoice(PrimitiveType type) {
  return type == kPrimitiveType_openchoice || type == kPrimitiveType_closedchoice;
}

bool PrimitiveTypeIsArray(PrimitiveType type) {
  return type == kPrimitiveType_bag || type == kPrimitiveType_seq || type == kPrimitiveType_alt;
}

bool IsTypeContainer(PrimitiveType type) {
  return PrimitiveTypeIsChoice(type) || type == kPrimitiveType_alt;
}

// --- Queries on definitions

bool IsStructType(TypeDefinition const& type) { return !type.fields.empty(); }

boost::optional<PrimitiveType> PrimitiveTypeOf(TypeDefinition const& type) {
  if (!type.type) return boost::none;
  if (auto primitive = PrimitiveTypeIdAsPrimitiveType(*type.type)) return primitive;
  return type.extends;
}

bool IsSimpleType(TypeDefinition const& type) {
  const auto primitive = PrimitiveTypeOf(type);
  if (!primitive) return false;
  if (PrimitiveTypeIsSimple(*primitive)) return true;
  if (PrimitiveTypeIsChoice(*primitive)) {
    return type.constraints.elementType && IsSimpleType(*type.constraints.elementType);
  }
  return false;
}

bool IsArrayType(TypeDefinition const& type) {
  const auto primitive = PrimitiveTypeOf(type);
  return primitive && PrimitiveTypeIsArray(*primitive);
}

boost::optional<UTF8String> ElementTypeIdOf(TypeDefinition const& type) {
  if (IsStructType(type) || !IsChoiceOrArrayKind(type.extends)) return boost::none;
  return type.constraints.elementType;
}

boost::optional<PrimitiveType> PrimitiveTypeOf(EntryDefinition const& entry) {
  if (!entry.type) return boost::none;
  return PrimitiveTypeOf(*entry.type);
}

boost::optional<UTF8String> ElementTypeIdOf(EntryDefinition const& entry) {
  if (!IsChoiceOrArrayKind(PrimitiveTypeOf(entry))) return boost::none;
  if (entry.constraints.elementType) return entry.constraints.elementType;
  if (entry.type) return ElementTypeIdOf(*entry.type);
  return boost::none;
}

// --- Factories

boost::shared_ptr<SchemaDefinition> CreateNewSchema(UTF8String namespaceURI, UTF8String prefix,
                                                    UTF16String labelSource, UTF16String label,
                                                    UTF16String descriptionSource,
                                                    UTF16String description) {
  auto schema = boost::shared_ptr<SchemaDefinition>(new SchemaDefinition);
  schema->namespaceURI = std::move(namespaceURI);
  schema->prefix = std::move(prefix);
  schema->labelSource = std::move(labelSource);
  schema->label = std::move(label);
  schema->descriptionSource = std::move(descriptionSource);
  schema->description = std::move(description);
  return schema;
}

boost::shared_ptr<PropertyDefinition> CreateNewProperty(PrimitiveType type, UTF8String name,
                                                        UTF16String labelSource, UTF16String label,
                                                        UTF16String descriptionSource,
                                                        UTF16String description) {
  auto property = boost::shared_ptr<PropertyDefinition>(new PropertyDefinition);
  const UTF8String typeId = PrimitiveTypeAsPrimitiveTypeId(type);
  if (!typeId.empty()) property->type = typeId;
  property->name = std::move(name);
  property->labelSource = std::move(labelSource);
  property->label = std::move(label);
  property->descriptionSource = std::move(descriptionSource);
  property->description = std::move(description);
  return property;
}

}  // namespace ovrametadata
