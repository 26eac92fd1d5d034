// ovrametadata: the definitions of schemas and types, the primitive types,
// the registry of definitions and the definitions-file parser.
//
// Definition objects are shared (boost::shared_ptr). The registry keeps what
// it registers until the last Terminate; objects handed out stay valid as
// long as the caller holds them. Registration happens on one thread during
// start-up and extension loading; lookups may run on any thread while no
// registration is in progress.
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include <boost/optional.hpp>
#include <boost/shared_ptr.hpp>

#include <ovrametadata/Common.h>

namespace ovrametadata {

// ---------------------------------------------------------------------------
// Primitive types and standard schemas

// The nine primitive kinds of value; the comment gives the type id used in
// definitions files.
enum PrimitiveType : int {
  kPrimitiveType_integer = 0,       // "integer"
  kPrimitiveType_real = 1,          // "real"
  kPrimitiveType_text = 2,          // "text"
  kPrimitiveType_boolean = 3,       // "boolean"
  kPrimitiveType_openchoice = 4,    // "openchoice"
  kPrimitiveType_closedchoice = 5,  // "closedchoice"
  kPrimitiveType_bag = 6,           // "bag"
  kPrimitiveType_seq = 7,           // "seq"
  kPrimitiveType_alt = 8            // "alt"
};

// The standard schemas with built-in definitions resources (named after
// the stem in the enumerator, followed by "_definitions").
enum StandardSchema : int {
  kStandardSchema_dc = 0,
  kStandardSchema_xmp = 1,
  kStandardSchema_xmpRights = 2,
  kStandardSchema_xmpMM = 3,
  kStandardSchema_xmpBJ = 4,
  kStandardSchema_xmpTPg = 5,
  kStandardSchema_xmpDM = 6,
  kStandardSchema_xmpPMAssign = 7,
  kStandardSchema_xmpPMMemo = 8,
  kStandardSchema_pdf = 9,
  kStandardSchema_pictora = 10,
  kStandardSchema_rwset = 11,
  kStandardSchema_exif = 12,
  kStandardSchema_exifEX = 13,
  kStandardSchema_tiff = 14,
  kStandardSchema_xmpCA = 15,
  kStandardSchema_xmpScript = 16,
  kStandardSchema_bext = 17,
  kStandardSchema_iptcCore = 18,
  kStandardSchema_iptcExtension = 19,
  kStandardSchema_dicom = 20,
  kStandardSchema_plus = 21,
  kStandardSchema_mobile = 22,
  kStandardSchema_as11core = 23,
  kStandardSchema_as11ukdpp = 24,
  kStandardSchema_as11structural = 25,
  kStandardSchema_iXML = 26,
  kStandardSchema_zel = 27
};
constexpr int kStandardSchemaCount = 28;

// The stem of a standard schema ("dc", "xmpDM", ...); empty when out of range.
OVRAMETADATA_EXPORT UTF8String StandardSchemaStem(StandardSchema schema);

// A plain calendar value; nothing is validated. Ordered field by field,
// year first.
struct Date {
  std::int32_t year = 0;
  std::int32_t month = 0;
  std::int32_t day = 0;
  std::int32_t hour = 0;
  std::int32_t minute = 0;
  std::int32_t second = 0;
};
OVRAMETADATA_EXPORT bool operator<(Date const& a, Date const& b);
OVRAMETADATA_EXPORT bool operator==(Date const& a, Date const& b);

// ---------------------------------------------------------------------------
// The model

struct ChoiceDefinition;
struct QualifierDefinition;
struct FieldDefinition;

// Base of everything with a display text. The source fields keep the texts
// as written in the definitions file (often "$$$/" localisation strings),
// the other two their localised form.
struct OVRAMETADATA_EXPORT LocalizedDefinition {
  LocalizedDefinition() = default;
  LocalizedDefinition(LocalizedDefinition const&) = default;
  LocalizedDefinition(LocalizedDefinition&&) = default;
  LocalizedDefinition& operator=(LocalizedDefinition const&) = default;
  LocalizedDefinition& operator=(LocalizedDefinition&&) = default;
  virtual ~LocalizedDefinition();

  UTF16String label;
  UTF16String description;
  UTF16String labelSource;
  UTF16String descriptionSource;
};

// Constraints and sub-entries shared by properties, fields, qualifiers and
// types.
struct EntryConstraints {
  boost::optional<UTF8String> elementType;  // elements of an array, values of a choice
  boost::optional<UTF8String> pattern;
  boost::optional<double> min;
  boost::optional<double> max;
  boost::optional<bool> deprecated;  // engaged when the file says anything
  std::vector<boost::shared_ptr<ChoiceDefinition>> choices;
  std::vector<boost::shared_ptr<QualifierDefinition>> qualifiers;
};

struct OVRAMETADATA_EXPORT EntryDefinition : LocalizedDefinition {
  EntryConstraints constraints;
  UTF8String name;                       // XMP local name, or a type's own id
  boost::optional<UTF8String> type;      // primitive type id or registered type name
  boost::optional<PrimitiveType> extends;
};

// How a property wants to be shown.
struct PropertyUIHints {
  bool separatorAfter = false;
  bool multiLine = false;
};

struct OVRAMETADATA_EXPORT PropertyDefinition : EntryDefinition {
  bool isInternal = false;
  // Kept with its default so that the layout matches what the rest of the
  // system expects; the library never reads or changes it.
  bool reservedFlag = true;
  boost::optional<PropertyUIHints> uiHints;
};

struct OVRAMETADATA_EXPORT FieldDefinition : EntryDefinition {
  UTF8String namespaceURI;  // may differ from the namespace of the property
  UTF8String prefix;
};

struct OVRAMETADATA_EXPORT QualifierDefinition : EntryDefinition {
  UTF8String namespaceURI;
  UTF8String prefix;
};

// A named type; a struct exactly when it has fields.
struct OVRAMETADATA_EXPORT TypeDefinition : EntryDefinition {
  std::vector<boost::shared_ptr<FieldDefinition>> fields;
};

struct OVRAMETADATA_EXPORT SchemaDefinition : LocalizedDefinition {
  UTF8String namespaceURI;
  UTF8String prefix;
  std::vector<boost::shared_ptr<PropertyDefinition>> properties;
  bool isCustom = true;    // true only for user-supplied custom schemas
  bool isDynamic = false;  // kept apart from the common schemas
};

// One allowed value of a choice.
struct ChoiceDefinition {
  UTF8String rawValue;      // the value stored in XMP
  UTF16String label;        // localised
  UTF16String labelSource;  // as written
};

using SchemaDefinitionPtr = boost::shared_ptr<SchemaDefinition>;
using TypeDefinitionPtr = boost::shared_ptr<TypeDefinition>;
using PropertyDefinitionPtr = boost::shared_ptr<PropertyDefinition>;

// The schemas (first) and types (second) read from one file or buffer, in
// document order.
using DefinitionsPair =
    std::pair<std::vector<SchemaDefinitionPtr>, std::vector<TypeDefinitionPtr>>;

// ---------------------------------------------------------------------------
// Primitive-type conversions and predicates

// The type id of a primitive type; empty for a value out of range.
OVRAMETADATA_EXPORT UTF8String PrimitiveTypeAsPrimitiveTypeId(PrimitiveType type);
// The primitive type of a type id (exact, case-sensitive); absent for any
// other text, "date" included.
OVRAMETADATA_EXPORT boost::optional<PrimitiveType> PrimitiveTypeIdAsPrimitiveType(
    UTF8String const& typeId);

OVRAMETADATA_EXPORT bool PrimitiveTypeIsSimple(PrimitiveType type);  // integer to boolean
OVRAMETADATA_EXPORT bool IsTypeSimpleScalar(PrimitiveType type);     // same
OVRAMETADATA_EXPORT bool PrimitiveTypeIsChoice(PrimitiveType type);  // the two choices
OVRAMETADATA_EXPORT bool PrimitiveTypeIsArray(PrimitiveType type);   // bag, seq, alt
// The kinds whose values are picked from allowed values or alternatives:
// the two choices and alt (not bag or seq).
OVRAMETADATA_EXPORT bool IsTypeContainer(PrimitiveType type);

// Queries on a type id: a primitive type id, else the registered type of
// that name. Unknown ids answer absent / false, except IsStructType.
OVRAMETADATA_EXPORT boost::optional<PrimitiveType> PrimitiveTypeOf(UTF8String const& typeId);
// True when PrimitiveTypeOf is absent, so an unknown id counts as a struct.
OVRAMETADATA_EXPORT bool IsStructType(UTF8String const& typeId);
OVRAMETADATA_EXPORT bool IsSimpleType(UTF8String const& typeId);
OVRAMETADATA_EXPORT bool IsArrayType(UTF8String const& typeId);
// The element type id of a registered type; absent otherwise.
OVRAMETADATA_EXPORT boost::optional<UTF8String> ElementTypeIdOf(UTF8String const& typeId);
// "integer", "real", "text" or "boolean".
OVRAMETADATA_EXPORT bool IsElementSimpleScalar(UTF8String const& typeId);
// A registered type that extends one of the four simple scalars.
OVRAMETADATA_EXPORT bool IsElementExtensionOfSimpleScalar(UTF8String const& typeId);
// Whether values of the type may be elements of a choice or alternative;
// "date" never may.
OVRAMETADATA_EXPORT bool DoesElementConformToContainer(UTF8String const& typeId);

// Queries on definitions.
OVRAMETADATA_EXPORT bool IsStructType(TypeDefinition const& type);
OVRAMETADATA_EXPORT boost::optional<PrimitiveType> PrimitiveTypeOf(TypeDefinition const& type);
OVRAMETADATA_EXPORT bool IsSimpleType(TypeDefinition const& type);
OVRAMETADATA_EXPORT bool IsArrayType(TypeDefinition const& type);
OVRAMETADATA_EXPORT boost::optional<UTF8String> ElementTypeIdOf(TypeDefinition const& type);
OVRAMETADATA_EXPORT boost::optional<PrimitiveType> PrimitiveTypeOf(EntryDefinition const& entry);
OVRAMETADATA_EXPORT boost::optional<UTF8String> ElementTypeIdOf(EntryDefinition const& entry);
// The registered type of the entry's elements, else of the entry itself;
// null when there is none. This is how arrays of structs find their struct.
OVRAMETADATA_EXPORT boost::shared_ptr<TypeDefinition> PropertyTypeOf(EntryDefinition const& entry);

// Factories for definitions built in code. The caller owns the result until
// it registers it.
OVRAMETADATA_EXPORT boost::shared_ptr<SchemaDefinition> CreateNewSchema(
    UTF8String namespaceURI, UTF8String prefix, UTF16String labelSource, UTF16String label,
    UTF16String descriptionSource, UTF16String description);
OVRAMETADATA_EXPORT boost::shared_ptr<PropertyDefinition> CreateNewProperty(
    PrimitiveType type, UTF8String name, UTF16String labelSource, UTF16String label,
    UTF16String descriptionSource, UTF16String description);

// ---------------------------------------------------------------------------
// The registry. Every function answers false / null / empty before
// Initialize and after the last Terminate. Problems are reported through
// SendError as kDefinitionRegistrationError with the given source.

// Registers a type under its name (and sets its `type` to that name),
// repairing a missing element type to "text" and registering the namespaces
// of its fields with the toolkit. False for null, for a duplicate name (the
// registered type stays) and when a field namespace cannot be registered
// (the type is then removed again).
OVRAMETADATA_EXPORT bool RegisterTypeDefinition(boost::shared_ptr<TypeDefinition> const& type,
                                                UTF16String const& source);
// Registers a schema under its namespace and its namespace with the
// toolkit (a refused prefix is reported, the schema stays registered) and
// repairs its properties. A namespace already registered is reported as a
// duplicate, or with mergeIntoExisting its new properties are appended to
// the registered schema; the result is then false all the same.
OVRAMETADATA_EXPORT bool RegisterSchemaDefinition(boost::shared_ptr<SchemaDefinition> const& schema,
                                                  UTF16String const& source,
                                                  bool mergeIntoExisting);
// Register every definition in order, never stopping; true when all
// succeeded (also for an empty list).
OVRAMETADATA_EXPORT bool RegisterTypeDefinitions(std::vector<TypeDefinitionPtr> const& types,
                                                 UTF16String const& source);
OVRAMETADATA_EXPORT bool RegisterSchemaDefinitions(
    std::vector<SchemaDefinitionPtr> const& schemas, UTF16String const& source,
    bool mergeIntoExisting);

// Erase the entry under the definition's name or namespace, whichever
// object it holds; false when there is none. Toolkit namespaces stay.
OVRAMETADATA_EXPORT bool RemoveTypeDefinition(boost::shared_ptr<TypeDefinition> const& type);
OVRAMETADATA_EXPORT bool RemoveSchemaDefinition(boost::shared_ptr<SchemaDefinition> const& schema);
// Whether a schema is registered under the schema's namespace.
OVRAMETADATA_EXPORT bool IsSchemaDefinitionAlreadyRegistered(
    boost::shared_ptr<SchemaDefinition> const& schema);

// Lookups; null when nothing is registered under the key.
OVRAMETADATA_EXPORT boost::shared_ptr<TypeDefinition> TypeIdDefinition(UTF8String const& typeId);
OVRAMETADATA_EXPORT boost::shared_ptr<SchemaDefinition> NamespaceDefinition(
    UTF8String const& namespaceURI);
// The first property of that name; null for a null schema or no match.
OVRAMETADATA_EXPORT boost::shared_ptr<PropertyDefinition> PropertyNameDefinition(
    boost::shared_ptr<SchemaDefinition> const& schema, UTF8String const& name);
// The namespace the standard schema's built-in resource declared; empty
// when none was loaded.
OVRAMETADATA_EXPORT UTF8String StandardSchemaNamespace(StandardSchema schema);
// The schemas loaded at start-up and from folders, common and dynamic apart,
// in loading order. The ranges are valid until the next registration or
// Terminate.
OVRAMETADATA_EXPORT Range<SchemaDefinitionPtr> CommonSchemaDefinitions();
OVRAMETADATA_EXPORT Range<SchemaDefinitionPtr> DynamicSchemaDefinitions();

// The namespace of a dynamic schema for a client-chosen name: the dynamic
// base URI, the name without a leading and a trailing "/", and "/1.0/".
// Works without Initialize.
OVRAMETADATA_EXPORT UTF8String MakeDynamicSchemaNamespace(UTF8String const& name);
// Whether the dynamic base URI occurs anywhere in the namespace.
OVRAMETADATA_EXPORT bool IsDynamicNamespace(UTF8String const& namespaceURI);

// The file each schema object was loaded from. A null schema is ignored;
// an unknown one answers an empty path.
OVRAMETADATA_EXPORT void SetFilePathForSchema(UTF16String const& path,
                                              boost::shared_ptr<SchemaDefinition> schema);
OVRAMETADATA_EXPORT UTF16String filePathForSchema(boost::shared_ptr<SchemaDefinition> schema);
// Every schema / type recorded for exactly that path; empty when none.
OVRAMETADATA_EXPORT std::vector<SchemaDefinitionPtr> allSchemasFromSourceFile(
    UTF16String const& path);
OVRAMETADATA_EXPORT std::vector<TypeDefinitionPtr> allTypesFromSourceFile(UTF16String const& path);

// Report entries whose types or element types name no registered type.
// They change nothing and always return true.
OVRAMETADATA_EXPORT bool CheckPropertyTypes(std::vector<SchemaDefinitionPtr> const& schemas,
                                            UTF16String const& source);
OVRAMETADATA_EXPORT bool CheckFieldTypes(std::vector<TypeDefinitionPtr> const& types,
                                         UTF16String const& source);

// ---------------------------------------------------------------------------
// Definitions files ("xmp_definitions" documents). Problems are reported
// through SendError as kDefinitionParsingError; nothing throws.

// Parses a buffer; on malformed XML reports it and returns what was read
// before the error.
OVRAMETADATA_EXPORT DefinitionsPair ParseBufferForDefinitions(UTF8String const& buffer,
                                                              UTF16String const& sourceName);
// Parses a file into `result`; false (after a report) when the file is
// missing or malformed, with what was read before the error kept.
OVRAMETADATA_EXPORT bool ParseDocumentForDefinitions(UTF16String const& path,
                                                     DefinitionsPair& result);
OVRAMETADATA_EXPORT DefinitionsPair ParseDocumentForDefinitions(UTF16String const& path);

// Parse, then register the types and the schemas. A list that did not
// register completely comes back empty (what did register stays
// registered); entries referring to unknown types are reported afterwards.
OVRAMETADATA_EXPORT DefinitionsPair ParseBufferAndRegisterDefinitions(UTF8String const& buffer,
                                                                      UTF16String const& sourceName,
                                                                      bool mergeIntoExisting);
OVRAMETADATA_EXPORT DefinitionsPair ParseDocumentAndRegisterDefinitions(UTF16String const& path,
                                                                        bool mergeIntoExisting);

// ---------------------------------------------------------------------------
// Writing definitions files. Labels and descriptions are written as the file
// they came from had them (localisation keys stay keys); the dynamic mark and
// the presentation hints are not written. Nothing is reported.

// The text of a definitions file holding schemas, then types; nulls skipped.
OVRAMETADATA_EXPORT UTF8String WriteDefinitionsToBuffer(Range<SchemaDefinitionPtr> schemas,
                                                        Range<TypeDefinitionPtr> types);
// Writes the pair to path (a new file renamed over the old one), making the
// folder when missing; false only when the folder cannot be made.
OVRAMETADATA_EXPORT bool WriteSchemaFile(DefinitionsPair const& definitions, UTF16String const& path);
// Writes the file schema was loaded from again, with every schema and type
// recorded for that file, so that editing one keeps its neighbours.
OVRAMETADATA_EXPORT void RewriteSchemaFile(SchemaDefinitionPtr schema);

}  // namespace ovrametadata
