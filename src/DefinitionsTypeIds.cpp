// The type-id queries that consult the registry.
#include <ovrametadata/Definitions.h>

namespace ovrametadata {

namespace {

// Choice types may name each other as element types; a cycle in a file
// must not recurse for ever.
constexpr int kMaxElementTypeDepth = 32;

bool IsSimpleTypeId(UTF8String const& typeId, int depth) {
  const auto primitive = PrimitiveTypeOf(typeId);
  if (!primitive) return false;
  if (PrimitiveTypeIsSimple(*primitive)) return true;
  if (!PrimitiveTypeIsChoice(*primitive)) return false;
  // A bare choice kind only counts through a registered type of that name.
  const auto type = TypeIdDefinition(typeId);
  if (!type) return false;
  if (!type->extends) return true;
  return type->constraints.elementType && depth < kMaxElementTypeDepth &&
         IsSimpleTypeId(*type->constraints.elementType, depth + 1);
}

}  // namespace

boost::optional<PrimitiveType> PrimitiveTypeOf(UTF8String const& typeId) {
  if (auto primitive = PrimitiveTypeIdAsPrimitiveType(typeId)) return primitive;
  if (const auto type = TypeIdDefinition(typeId)) return type->extends;
  return boost::none;
}

bool IsStructType(UTF8String const& typeId) { return !PrimitiveTypeOf(typeId); }

bool IsSimpleType(UTF8String const& typeId) { return IsSimpleTypeId(typeId, 0); }

bool IsArrayType(UTF8String const& typeId) {
  const auto primitive = PrimitiveTypeOf(typeId);
  return primitive && PrimitiveTypeIsArray(*primitive);
}

boost::optional<UTF8String> ElementTypeIdOf(UTF8String const& typeId) {
  if (const auto type = TypeIdDefinition(typeId)) return ElementTypeIdOf(*type);
  return boost::none;
}

bool IsElementSimpleScalar(UTF8String const& typeId) {
  return typeId == "integer" || typeId == "real" || typeId == "text" || typeId == "boolean";
}

bool IsElementExtensionOfSimpleScalar(UTF8String const& typeId) {
  const auto type = TypeIdDefinition(typeId);
  return type && type->extends && PrimitiveTypeIsSimple(*type->extends);
}

bool DoesElementConformToContainer(UTF8String const& typeId) {
  if (IsElementSimpleScalar(typeId)) return true;
  // Dates are deliberately not allowed as elements of choices or alternatives.
  if (typeId == "date") return false;
  return IsElementExtensionOfSimpleScalar(typeId);
}

boost::shared_ptr<TypeDefinition> PropertyTypeOf(EntryDefinition const& entry) {
  if (const auto element = ElementTypeIdOf(entry)) return TypeIdDefinition(*element);
  if (entry.type) return TypeIdDefinition(*entry.type);
  return {};
}

}  // namespace ovrametadata
