/// @file
/// Schemas: a host's categories and properties declared in JSON and registered
/// with the style manager in one call, with stock behaviours and conversion
/// policies for every type, so that a host describes its model instead of
/// writing behaviours. A word-processor schema is compiled in.
#pragma once

#include <StylesTools/Export.h>

#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <optional>
#include <vector>

namespace Styles {

class BaseStyleProperty;

namespace Tools {

/// The kinds of value a schema property can hold. Numbers are held as double,
/// integers as int, flags as bool; text, colours ("#RRGGBB", upper case) and
/// enumerations as ZelStringT<char16_t>; a substyle as Style*, an array of
/// substyles as std::vector<Style*>.
enum class ValueType { Number, Integer, Bool, Text, Colour, Enum, Substyle, Array };

/// One property of a category in a schema.
struct STYLES_TOOLS_API PropertySchema {
  /// The property's key in its category.
  PropertyKey key;
  /// The kind of value the property holds.
  ValueType type = ValueType::Text;
  ///@{

  /// Inclusive bounds of numbers and integers.
  std::optional<double> minimum;
  std::optional<double> maximum;
  ///@}

  /// The texts an enumeration allows, in the schema's order.
  std::vector<ZelStringT<char16_t>> allowed;
  /// The category of a substyle or of the elements of an array.
  PropertyKey elementCategory;
  /// The default of a plain property; empty for substyles and arrays.
  ZelUtils::Any defaultValue;
  /// The oldest document version that holds the property.
  int minimumVersion = 0;
  /// Left out of written styles unless asked for (BaseStyleProperty::IsTemporary).
  bool temporary = false;
  /// Read after the current properties (BaseStyleProperty::IsDeprecated).
  bool deprecated = false;
  /// A plain property that belongs to each style alone: merging a parent's
  /// values and flattening leave it out, and the toolkit's resolution
  /// (ResolveProperty, ListEffectiveValues) gives the style's own value or the
  /// default. Style::GetProperty itself still climbs the parents.
  bool perStyle = false;
};

/// One category of a schema.
struct STYLES_TOOLS_API CategorySchema {
  /// The category's key.
  PropertyKey key;
  /// The name shown to users.
  ZelStringT<char16_t> uiName;
  /// Whether ordinary styles ("style") get a substyle of this category.
  bool styleSubstyle = false;
  /// The properties, in registration order.
  std::vector<PropertySchema> properties;
};

/// A host's categories and properties, as ParseSchema reads them.
struct STYLES_TOOLS_API Schema {
  /// The document version that sheets are written with.
  int version = 1;
  /// The UI name of the category of ordinary styles, registered only when some
  /// category sets styleSubstyle.
  ZelStringT<char16_t> styleCategoryName = u"Style";
  /// The categories, in registration order.
  std::vector<CategorySchema> categories;

  /// The category of that key, or null; owned by the schema.
  const CategorySchema* FindCategory(const PropertyKey& key) const;
};

/// What is wrong with a schema: a JSON Pointer to the member and a message.
struct STYLES_TOOLS_API SchemaError {
  /// JSON Pointer to the member at fault; empty for the whole text.
  ZelStringT<char16_t> pointer;
  /// What is wrong with it, in one sentence.
  ZelStringT<char16_t> message;
};

/// Reads a schema from JSON text. False, with `error` telling the first
/// problem, when the text is not a well-formed schema; `schema` is then left
/// as it was.
STYLES_TOOLS_API bool ParseSchema(const ZelStringT<char16_t>& text, Schema& schema,
                                  SchemaError& error);

/// The JSON text of the built-in word-processor schema (paragraph with an owned
/// character substyle, character, table with an array of cells, cell).
STYLES_TOOLS_API const char16_t* DefaultSchemaText();
/// The built-in schema, parsed.
STYLES_TOOLS_API Schema DefaultSchema();

/// A new stock behaviour for `property`; the caller owns it until it hands it
/// to StyleManager::RegisterProperty. Plain types check their kind, bounds,
/// allowed texts and colour form in CheckType; their conversion policies refuse
/// text that is not a number, an integer, a flag, a colour or an allowed text.
STYLES_TOOLS_API BaseStyleProperty* CreateBehaviour(const PropertySchema& property);
/// Whether `behaviour` is a stock behaviour of a property marked perStyle.
STYLES_TOOLS_API bool IsPerStyle(const BaseStyleProperty& behaviour);

/// What RegisterSchema added to the manager, so that it can be taken out again.
struct STYLES_TOOLS_API SchemaRegistration {
  /// Category keys in registration order.
  std::vector<PropertyKey> categories;
  /// The manager's version before RegisterSchema; DeregisterSchema restores it.
  int previousVersion = -1;
  /// True from a successful RegisterSchema until DeregisterSchema.
  bool active = false;
};

/// Registers every category and property of `schema` with the manager and sets
/// the manager's current version to the schema's. A schema that names a
/// category the manager already has (or "style", when a category asks for it),
/// or a category called "version" or "id" (a document's own members), is
/// refused whole: nothing is registered and `error` says why. The first
/// registration of a key wins in the manager, so adding to a host's category
/// could silently keep the host's behaviours; and deregistering the schema
/// would then remove the host's category.
STYLES_TOOLS_API bool RegisterSchema(const Schema& schema, SchemaRegistration& registration,
                                     SchemaError& error);
/// Deregisters, in reverse order, the categories `registration` lists (their
/// behaviours are deleted) and restores the manager's previous version. No
/// style of those categories may be left. Does nothing for an inactive
/// registration; afterwards it is inactive.
STYLES_TOOLS_API void DeregisterSchema(SchemaRegistration& registration);

} // namespace Tools
} // namespace Styles
