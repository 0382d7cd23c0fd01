#include <StylesTools/Schema.h>

#include <Internal/ToolsSupport.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <algorithm>
#include <cassert>
#include <climits>
#include <cmath>
#include <memory>
#include <utility>

namespace Styles {
namespace Tools {

using detail::AppendPointer;
using detail::Quoted;
using detail::Text;
using ZelUtils::Any;

namespace {

[[noreturn]] void Refuse() { throw ZelPref::Detail::BadConversion(); }

bool IsHexDigit(char16_t c) {
  return (c >= u'0' && c <= u'9') || (c >= u'a' && c <= u'f') || (c >= u'A' && c <= u'F');
}

bool IsColourText(std::u16string_view text) {
  return text.size() == 7 && text[0] == u'#' &&
         std::all_of(text.begin() + 1, text.end(), IsHexDigit);
}

Text UpperCase(std::u16string_view text) {
  std::u16string upper(text);
  for (char16_t& c : upper)
    if (c >= u'a' && c <= u'z')
      c = static_cast<char16_t>(c - u'a' + u'A');
  return Text(std::move(upper));
}

// Colours as "#RRGGBB"; letters are read in either case and kept upper case.
class ColourConversionPolicy final : public ZelPref::ConversionPolicy {
public:
  Text ToText(const Any& value) const override {
    const Text* text = value.GetIf<Text>();
    if (!text || !IsColourText(*text))
      Refuse();
    return *text;
  }
  Any FromText(const Text& text) const override {
    if (!IsColourText(text))
      Refuse();
    return Any(UpperCase(text));
  }
};

// One of a fixed list of texts, compared exactly.
class EnumConversionPolicy final : public ZelPref::ConversionPolicy {
public:
  explicit EnumConversionPolicy(std::vector<Text> allowed) : m_allowed(std::move(allowed)) {}
  Text ToText(const Any& value) const override {
    const Text* text = value.GetIf<Text>();
    if (!text || !IsAllowed(*text))
      Refuse();
    return *text;
  }
  Any FromText(const Text& text) const override {
    if (!IsAllowed(text))
      Refuse();
    return Any(text);
  }
  bool IsAllowed(const Text& text) const {
    return std::find(m_allowed.begin(), m_allowed.end(), text) != m_allowed.end();
  }

private:
  std::vector<Text> m_allowed;
};

bool InRange(double number, const PropertySchema& property) {
  return (!property.minimum || number >= *property.minimum) &&
         (!property.maximum || number <= *property.maximum);
}

// Whether `value` is one the schema property allows: its kind and then its
// bounds, allowed texts or colour form.
bool Accepts(const PropertySchema& property, const Any& value) {
  switch (property.type) {
  case ValueType::Number: {
    const double* number = value.GetIf<double>();
    return number && std::isfinite(*number) && InRange(*number, property);
  }
  case ValueType::Integer: {
    const int* number = value.GetIf<int>();
    return number && InRange(*number, property);
  }
  case ValueType::Bool:
    return value.GetIf<bool>() != nullptr;
  case ValueType::Text:
    return value.GetIf<Text>() != nullptr;
  case ValueType::Colour: {
    const Text* text = value.GetIf<Text>();
    return text && IsColourText(*text);
  }
  case ValueType::Enum: {
    const Text* text = value.GetIf<Text>();
    return text && std::find(property.allowed.begin(), property.allowed.end(), *text) !=
                       property.allowed.end();
  }
  case ValueType::Substyle:
  case ValueType::Array:
    break;
  }
  return false;
}

ZelPref::ConversionPolicy* CreatePolicy(const PropertySchema& property) {
  switch (property.type) {
  case ValueType::Number:
    return new ZelPref::NumberConversionPolicy;
  case ValueType::Integer:
    return new ZelPref::IntegerConversionPolicy;
  case ValueType::Bool:
    return new ZelPref::BooleanConversionPolicy;
  case ValueType::Colour:
    return new ColourConversionPolicy;
  case ValueType::Enum:
    return new EnumConversionPolicy(property.allowed);
  case ValueType::Text:
  case ValueType::Substyle:
  case ValueType::Array:
    break;
  }
  return new ZelPref::TextConversionPolicy;
}

// A plain value whose type check is the schema's.
class SchemaProperty final : public StyleProperty {
public:
  explicit SchemaProperty(const PropertySchema& property)
      : StyleProperty(property.defaultValue, CreatePolicy(property), nullptr,
                      property.minimumVersion),
        m_property(property) {}
  bool CheckType(const Any& value) const override { return Accepts(m_property, value); }
  bool IsTemporary() const override { return m_property.temporary; }
  bool IsDeprecated() const override { return m_property.deprecated; }
  bool IsPerStyle() const { return m_property.perStyle; }
  // A per-style value is never taken from a parent, so neither merging nor
  // flattening copies one down.
  void MergeParentProperty(Style* target, const Style* parent,
                           const PropertyKey& key) const override {
    if (!m_property.perStyle)
      StyleProperty::MergeParentProperty(target, parent, key);
  }
  bool FlattenProperty(Style* style, const PropertyKey& key) const override {
    return !m_property.perStyle && StyleProperty::FlattenProperty(style, key);
  }

private:
  PropertySchema m_property;
};

// Substyle and array behaviours with the schema's flags. The core behaviours
// take no minimum version, so these leave the property out of older sheets.
template <class Base> class SchemaSubstyleProperty final : public Base {
public:
  explicit SchemaSubstyleProperty(const PropertySchema& property)
      : Base(property.elementCategory), m_minimumVersion(property.minimumVersion),
        m_temporary(property.temporary), m_deprecated(property.deprecated) {}
  bool Serialize(const StyleSheet& sheet, const Style* style, const Any& value,
                 JsonValue& out) const override {
    if (sheet.GetVersion() < m_minimumVersion)
      return false;
    return Base::Serialize(sheet, style, value, out);
  }
  bool IsTemporary() const override { return m_temporary; }
  bool IsDeprecated() const override { return m_deprecated; }

private:
  int m_minimumVersion;
  bool m_temporary;
  bool m_deprecated;
};

// ---------------------------------------------------------------------------
// Reading a schema. Every check throws a SchemaError naming the member.

// A document's own members beside its categories: a category of that name
// would make the document hold the name twice.
bool IsSheetMemberName(const PropertyKey& key) {
  return key.GetString() == u"version" || key.GetString() == u"id";
}

struct SchemaReader {
  [[noreturn]] static void Fail(const Text& pointer, const Text& message) {
    throw SchemaError{pointer, message};
  }

  static const Json::Object& AsObject(const Json::Value& value, const Text& pointer) {
    const Json::Object* object = value.GetIf<Json::Object>();
    if (!object)
      Fail(pointer, u"must be an object");
    return *object;
  }
  static const Json::Array& AsArray(const Json::Value& value, const Text& pointer) {
    const Json::Array* array = value.GetIf<Json::Array>();
    if (!array)
      Fail(pointer, u"must be an array");
    return *array;
  }
  static const Text& AsText(const Json::Value& value, const Text& pointer) {
    const Text* text = value.GetIf<Text>();
    if (!text)
      Fail(pointer, u"must be a string");
    return *text;
  }
  static bool AsBool(const Json::Value& value, const Text& pointer) {
    const bool* flag = value.GetIf<bool>();
    if (!flag)
      Fail(pointer, u"must be true or false");
    return *flag;
  }
  static double AsNumber(const Json::Value& value, const Text& pointer) {
    const double* number = value.GetIf<double>();
    if (!number)
      Fail(pointer, u"must be a number");
    return *number;
  }
  static int AsInteger(const Json::Value& value, const Text& pointer, int minimum) {
    const double number = AsNumber(value, pointer);
    if (std::trunc(number) != number || number < minimum || number > INT_MAX)
      Fail(pointer,
           u"must be a whole number of at least " + detail::Widen(std::to_string(minimum)));
    return static_cast<int>(number);
  }
  // A non-empty key that can be a property or category name and a path step.
  static PropertyKey AsKey(const Json::Value& value, const Text& pointer) {
    const Text& text = AsText(value, pointer);
    if (text.IsEmpty())
      Fail(pointer, u"must not be empty");
    if (text.GetView().find(u'.') != std::u16string_view::npos)
      Fail(pointer, u"must not contain \".\", which separates the keys of a path");
    return PropertyKey(text);
  }
  // Refuses members other than `known`, which catches misspelt names.
  static void CheckMembers(const Json::Object& object, const Text& pointer,
                           std::initializer_list<const char16_t*> known) {
    for (std::size_t i = 0; i < object.GetSize(); ++i) {
      const Text& name = object.GetValueName(i);
      if (std::none_of(known.begin(), known.end(),
                       [&](const char16_t* candidate) { return name == candidate; }))
        Fail(AppendPointer(pointer, name), u"is not a member of the schema format");
    }
  }

  static ValueType ReadType(const Json::Value& value, const Text& pointer) {
    static const std::pair<const char16_t*, ValueType> kTypes[] = {
        {u"number", ValueType::Number},     {u"integer", ValueType::Integer},
        {u"bool", ValueType::Bool},         {u"text", ValueType::Text},
        {u"colour", ValueType::Colour},     {u"enum", ValueType::Enum},
        {u"substyle", ValueType::Substyle}, {u"array", ValueType::Array}};
    const Text& text = AsText(value, pointer);
    for (const auto& [name, type] : kTypes)
      if (text == name)
        return type;
    Fail(pointer, u"must be one of number, integer, bool, text, colour, enum, substyle, array");
  }

  static Any ReadDefault(const PropertySchema& property, const Json::Value* value,
                         const Text& pointer) {
    switch (property.type) {
    case ValueType::Number: {
      const double number = value ? AsNumber(*value, pointer) : 0.0;
      if (value && !InRange(number, property))
        Fail(pointer, u"lies outside the minimum and maximum");
      return Any(number);
    }
    case ValueType::Integer: {
      const double number = value ? AsNumber(*value, pointer) : 0.0;
      if (std::trunc(number) != number || number < INT_MIN || number > INT_MAX)
        Fail(pointer, u"must be a whole number");
      if (value && !InRange(number, property))
        Fail(pointer, u"lies outside the minimum and maximum");
      return Any(static_cast<int>(number));
    }
    case ValueType::Bool:
      return Any(value ? AsBool(*value, pointer) : false);
    case ValueType::Text:
      return Any(value ? AsText(*value, pointer) : Text());
    case ValueType::Colour: {
      if (!value)
        return Any(Text(u"#000000"));
      const Text& text = AsText(*value, pointer);
      if (!IsColourText(text))
        Fail(pointer, u"must be a colour written #RRGGBB");
      return Any(UpperCase(text));
    }
    case ValueType::Enum: {
      if (!value)
        return Any(property.allowed.front());
      const Text& text = AsText(*value, pointer);
      if (std::find(property.allowed.begin(), property.allowed.end(), text) ==
          property.allowed.end())
        Fail(pointer, u"must be one of the allowed values");
      return Any(text);
    }
    case ValueType::Substyle:
    case ValueType::Array:
      if (value)
        Fail(pointer, u"substyles and arrays have no default");
      break;
    }
    return Any();
  }

  static PropertySchema ReadProperty(const Json::Value& value, const Text& pointer) {
    const Json::Object& object = AsObject(value, pointer);
    CheckMembers(object, pointer,
                 {u"key", u"type", u"default", u"minimum", u"maximum", u"values", u"category",
                  u"minimumVersion", u"temporary", u"deprecated", u"perStyle"});
    PropertySchema property;
    const Json::Value* key = object.Find(u"key");
    if (!key)
      Fail(pointer, u"needs a \"key\"");
    property.key = AsKey(*key, AppendPointer(pointer, u"key"));
    for (const char16_t* reserved : {u"inherits", u"id", u"original"})
      if (property.key.GetString() == reserved)
        Fail(AppendPointer(pointer, u"key"), u"is a reserved member name of styles");
    const Json::Value* type = object.Find(u"type");
    if (!type)
      Fail(pointer, u"needs a \"type\"");
    property.type = ReadType(*type, AppendPointer(pointer, u"type"));

    const bool numeric = property.type == ValueType::Number || property.type == ValueType::Integer;
    for (const char16_t* bound : {u"minimum", u"maximum"}) {
      const Json::Value* limit = object.Find(bound);
      if (!limit)
        continue;
      const Text limitPointer = AppendPointer(pointer, bound);
      if (!numeric)
        Fail(limitPointer, u"applies to number and integer properties only");
      const double number = AsNumber(*limit, limitPointer);
      (Text(bound) == u"minimum" ? property.minimum : property.maximum) = number;
    }
    if (property.minimum && property.maximum && *property.minimum > *property.maximum)
      Fail(AppendPointer(pointer, u"minimum"), u"is greater than the maximum");

    const Json::Value* values = object.Find(u"values");
    const Text valuesPointer = AppendPointer(pointer, u"values");
    if (property.type == ValueType::Enum) {
      if (!values)
        Fail(pointer, u"an enum needs \"values\"");
      const Json::Array& array = AsArray(*values, valuesPointer);
      if (array.IsEmpty())
        Fail(valuesPointer, u"must not be empty");
      for (std::size_t i = 0; i < array.GetSize(); ++i) {
        const Text& text = AsText(array.GetValue(i), AppendPointer(valuesPointer, i));
        if (std::find(property.allowed.begin(), property.allowed.end(), text) !=
            property.allowed.end())
          Fail(AppendPointer(valuesPointer, i), u"repeats an allowed value");
        property.allowed.push_back(text);
      }
    } else if (values) {
      Fail(valuesPointer, u"applies to enum properties only");
    }

    const Json::Value* category = object.Find(u"category");
    const bool holdsStyles =
        property.type == ValueType::Substyle || property.type == ValueType::Array;
    if (holdsStyles) {
      if (!category)
        Fail(pointer, u"a substyle or array needs the \"category\" of its styles");
      property.elementCategory = AsKey(*category, AppendPointer(pointer, u"category"));
    } else if (category) {
      Fail(AppendPointer(pointer, u"category"), u"applies to substyle and array properties only");
    }

    property.defaultValue =
        ReadDefault(property, object.Find(u"default"), AppendPointer(pointer, u"default"));
    if (const Json::Value* version = object.Find(u"minimumVersion"))
      property.minimumVersion = AsInteger(*version, AppendPointer(pointer, u"minimumVersion"), 0);
    if (const Json::Value* flag = object.Find(u"temporary"))
      property.temporary = AsBool(*flag, AppendPointer(pointer, u"temporary"));
    if (const Json::Value* flag = object.Find(u"deprecated"))
      property.deprecated = AsBool(*flag, AppendPointer(pointer, u"deprecated"));
    if (const Json::Value* flag = object.Find(u"perStyle")) {
      property.perStyle = AsBool(*flag, AppendPointer(pointer, u"perStyle"));
      if (holdsStyles && property.perStyle)
        Fail(AppendPointer(pointer, u"perStyle"), u"applies to plain properties only");
    }
    return property;
  }

  static CategorySchema ReadCategory(const Json::Value& value, const Text& pointer) {
    const Json::Object& object = AsObject(value, pointer);
    CheckMembers(object, pointer, {u"key", u"name", u"styleSubstyle", u"properties"});
    CategorySchema category;
    const Json::Value* key = object.Find(u"key");
    if (!key)
      Fail(pointer, u"needs a \"key\"");
    category.key = AsKey(*key, AppendPointer(pointer, u"key"));
    if (category.key == StyleCategoryName)
      Fail(AppendPointer(pointer, u"key"),
           u"\"style\" is the category of ordinary styles; set \"styleSubstyle\" instead");
    if (IsSheetMemberName(category.key))
      Fail(AppendPointer(pointer, u"key"), u"is a member name of documents, not a category");
    const Json::Value* name = object.Find(u"name");
    category.uiName = name ? AsText(*name, AppendPointer(pointer, u"name")) : key->Get<Text>();
    if (const Json::Value* flag = object.Find(u"styleSubstyle"))
      category.styleSubstyle = AsBool(*flag, AppendPointer(pointer, u"styleSubstyle"));
    if (const Json::Value* properties = object.Find(u"properties")) {
      const Text listPointer = AppendPointer(pointer, u"properties");
      const Json::Array& array = AsArray(*properties, listPointer);
      for (std::size_t i = 0; i < array.GetSize(); ++i) {
        const Text propertyPointer = AppendPointer(listPointer, i);
        PropertySchema property = ReadProperty(array.GetValue(i), propertyPointer);
        for (const PropertySchema& earlier : category.properties)
          if (earlier.key == property.key)
            Fail(AppendPointer(propertyPointer, u"key"), u"repeats the key of another property");
        category.properties.push_back(std::move(property));
      }
    }
    return category;
  }

  static Schema Read(const Json::Value& root) {
    const Json::Object& object = AsObject(root, Text());
    CheckMembers(object, Text(), {u"version", u"styleCategoryName", u"categories"});
    Schema schema;
    if (const Json::Value* version = object.Find(u"version"))
      schema.version = AsInteger(*version, u"/version", 0);
    if (const Json::Value* name = object.Find(u"styleCategoryName"))
      schema.styleCategoryName = AsText(*name, u"/styleCategoryName");
    const Json::Value* categories = object.Find(u"categories");
    if (!categories)
      Fail(Text(), u"needs \"categories\"");
    const Json::Array& array = AsArray(*categories, u"/categories");
    for (std::size_t i = 0; i < array.GetSize(); ++i) {
      const Text pointer = AppendPointer(Text(u"/categories"), i);
      CategorySchema category = ReadCategory(array.GetValue(i), pointer);
      if (schema.FindCategory(category.key))
        Fail(AppendPointer(pointer, u"key"), u"repeats the key of another category");
      schema.categories.push_back(std::move(category));
    }
    // Element categories must be declared, so that no substyle is read into a
    // style without category (whose members the import would all drop).
    for (std::size_t i = 0; i < schema.categories.size(); ++i) {
      const CategorySchema& category = schema.categories[i];
      for (std::size_t j = 0; j < category.properties.size(); ++j) {
        const PropertySchema& property = category.properties[j];
        if ((property.type == ValueType::Substyle || property.type == ValueType::Array) &&
            !schema.FindCategory(property.elementCategory))
          Fail(AppendPointer(
                   AppendPointer(
                       AppendPointer(AppendPointer(Text(u"/categories"), i), u"properties"), j),
                   u"category"),
               u"names a category the schema does not declare");
      }
    }
    return schema;
  }
};

} // namespace

const CategorySchema* Schema::FindCategory(const PropertyKey& key) const {
  for (const CategorySchema& category : categories)
    if (category.key == key)
      return &category;
  return nullptr;
}

bool ParseSchema(const Text& text, Schema& schema, SchemaError& error) {
  Json::Value root;
  Text parseError;
  if (!Json::Parse(text, root, parseError)) {
    error = SchemaError{Text(), u"is not JSON: " + parseError};
    return false;
  }
  try {
    schema = SchemaReader::Read(root);
  } catch (SchemaError& failure) {
    error = std::move(failure);
    return false;
  }
  return true;
}

Schema DefaultSchema() {
  Schema schema;
  SchemaError error;
  const bool parsed = ParseSchema(Text(DefaultSchemaText()), schema, error);
  (void)parsed;
  assert(parsed && "the built-in schema is well formed");
  return schema;
}

BaseStyleProperty* CreateBehaviour(const PropertySchema& property) {
  switch (property.type) {
  case ValueType::Substyle:
    return new SchemaSubstyleProperty<StyleSetProperty>(property);
  case ValueType::Array:
    return new SchemaSubstyleProperty<StyleArrayProperty>(property);
  default:
    return new SchemaProperty(property);
  }
}

bool IsPerStyle(const BaseStyleProperty& behaviour) {
  const auto* stock = dynamic_cast<const SchemaProperty*>(&behaviour);
  return stock && stock->IsPerStyle();
}

bool RegisterSchema(const Schema& schema, SchemaRegistration& registration, SchemaError& error) {
  StyleManager& manager = GetStyleManager();
  bool styleSubstyles = false;
  for (std::size_t i = 0; i < schema.categories.size(); ++i) {
    const CategorySchema& category = schema.categories[i];
    const Text pointer = AppendPointer(Text(u"/categories"), i);
    if (IsSheetMemberName(category.key)) {
      error = SchemaError{AppendPointer(pointer, u"key"),
                          u"is a member name of documents, not a category"};
      return false;
    }
    if (manager.FindCategory(category.key)) {
      error =
          SchemaError{AppendPointer(pointer, u"key"),
                      u"category " + Quoted(category.key.GetString()) + u" is already registered"};
      return false;
    }
    styleSubstyles = styleSubstyles || category.styleSubstyle;
  }
  if (styleSubstyles && manager.FindCategory(StyleCategoryName)) {
    error = SchemaError{Text(), u"the category of ordinary styles is already registered"};
    return false;
  }

  SchemaRegistration made;
  made.previousVersion = manager.GetCurrentVersion();
  for (const CategorySchema& category : schema.categories) {
    // Not flagged for the manager's list of substyle sets: that list outlives
    // deregistration, so the schema builds the ordinary category itself.
    manager.RegisterCategory(category.key, category.uiName, false, false);
    made.categories.push_back(category.key);
    for (const PropertySchema& property : category.properties) {
      std::unique_ptr<BaseStyleProperty> behaviour(CreateBehaviour(property));
      manager.RegisterProperty(category.key, property.key, behaviour.get());
      // A key listed twice (a schema built in code) keeps the first behaviour.
      if (manager.GetStyleProperty(category.key, property.key) == behaviour.get())
        behaviour.release();
    }
  }
  if (styleSubstyles) {
    manager.RegisterCategory(StyleCategoryName, schema.styleCategoryName, false, true);
    made.categories.push_back(StyleCategoryName);
    for (const CategorySchema& category : schema.categories)
      if (category.styleSubstyle)
        RegisterSubstyleSet(StyleCategoryName, category.key);
  }
  manager.SetCurrentVersion(schema.version);
  made.active = true;
  registration = std::move(made);
  return true;
}

void DeregisterSchema(SchemaRegistration& registration) {
  if (!registration.active)
    return;
  StyleManager& manager = GetStyleManager();
  for (auto key = registration.categories.rbegin(); key != registration.categories.rend(); ++key)
    manager.DeregisterCategory(*key);
  manager.SetCurrentVersion(registration.previousVersion);
  registration = SchemaRegistration();
}

} // namespace Tools
} // namespace Styles
