#include <StylesWord/WordSchema.h>

#include <Internal/WordMap.h>

#include <StylesTools/Provenance.h>

#include <Styles/StyleSheet.h>

namespace Styles {
namespace Word {

using detail::Container;
using detail::Text;
using detail::Unit;
using detail::Widen;
using Tools::PropertySchema;
using Tools::ValueType;
using ZelUtils::Any;

namespace {

PropertySchema Plain(const char* key, ValueType type, Any defaultValue) {
  PropertySchema property;
  property.key = PropertyKey(Widen(key));
  property.type = type;
  property.defaultValue = std::move(defaultValue);
  return property;
}

PropertySchema Substyle(const char* key, const char16_t* category) {
  PropertySchema property;
  property.key = PropertyKey(Widen(key));
  property.type = ValueType::Substyle;
  property.elementCategory = PropertyKey(category);
  return property;
}

PropertySchema FromField(const detail::Field& field) {
  switch (field.unit) {
  case Unit::Text:
  case Unit::Colour:
    return Plain(field.key, ValueType::Text, Any(Text()));
  case Unit::OnOff:
    return Plain(field.key, ValueType::Bool, Any(false));
  case Unit::Integer:
    return Plain(field.key, ValueType::Integer, Any(0));
  case Unit::LineSpacing:
    return Plain(field.key, ValueType::Number, Any(1.0));
  case Unit::HalfPoints:
    // Word's size when nothing sets one.
    return Plain(field.key, ValueType::Number,
                 Any(std::string_view(field.key).rfind("fontSize", 0) == 0 ? 10.0 : 0.0));
  default:
    return Plain(field.key, ValueType::Number, Any(0.0));
  }
}

// The fields of `containers`, then the raw keys of each.
void AddContainers(Tools::CategorySchema& category, std::initializer_list<Container> containers) {
  // A style's own data (default flag, next, link, priority, ...) is never
  // taken from the style it is based on.
  const auto add = [&](Container container, PropertySchema property) {
    property.perStyle = container == Container::Style;
    category.properties.push_back(std::move(property));
  };
  for (Container container : containers)
    for (const detail::Group& group : detail::Groups())
      if (group.container == container)
        for (const detail::Field* field : group.fields)
          add(container, FromField(*field));
  for (Container container : containers)
    add(container, Plain(detail::RawKey(container), ValueType::Text, Any(Text())));
}

} // namespace

Tools::Schema WordSchema() {
  Tools::Schema schema;
  schema.version = 1;
  const auto category = [&](const char16_t* key, const char16_t* name) -> Tools::CategorySchema& {
    schema.categories.push_back(Tools::CategorySchema{PropertyKey(key), name, false, {}});
    return schema.categories.back();
  };
  AddContainers(category(u"character", u"Character"), {Container::Style, Container::Run});
  Tools::CategorySchema& paragraph = category(u"paragraph", u"Paragraph");
  AddContainers(paragraph, {Container::Style, Container::Paragraph});
  paragraph.properties.push_back(Substyle("character", u"character"));
  Tools::CategorySchema& table = category(u"table", u"Table");
  AddContainers(table, {Container::Style, Container::Table, Container::Row, Container::Cell});
  table.properties.push_back(Substyle("paragraph", u"paragraph"));
  table.properties.push_back(Substyle("character", u"character"));
  for (const char* const* format = detail::ConditionalFormats(); *format; ++format)
    table.properties.push_back(Substyle(*format, u"table"));
  AddContainers(category(u"numbering", u"Numbering"), {Container::Style, Container::Paragraph});
  Tools::CategorySchema& part = category(u"document", u"Styles Part");
  for (const char* key : {"rootElement", "latentStyles", "defaultsXml", "extraXml", "styleOrder",
                          "themeMajorLatin", "themeMajorEastAsia", "themeMajorComplex",
                          "themeMinorLatin", "themeMinorEastAsia", "themeMinorComplex"})
    part.properties.push_back(Plain(key, ValueType::Text, Any(Text())));
  return schema;
}

ZelStringT<char16_t> DefaultsStyleName(const PropertyKey& category) {
  const std::u16string_view key = category.GetString().GetView();
  if (key == u"paragraph")
    return u"Paragraph Defaults";
  if (key == u"character")
    return u"Character Defaults";
  if (key == u"table")
    return u"Table Defaults";
  if (key == u"numbering")
    return u"Numbering Defaults";
  return Text();
}

const char16_t* PartStyleName() { return u"Styles Part"; }

bool IsPartStyle(const StyleSheet& sheet, const Style* style) {
  if (!style)
    return false;
  while (style->GetOwner())
    style = style->GetOwner();
  const Text name = sheet.GetStyleName(style);
  if (name.IsEmpty())
    return false;
  return name.CompareNoCase(PartStyleName()) == 0 ||
         name.CompareNoCase(DefaultsStyleName(style->GetCategoryName()).GetView()) == 0;
}

bool IsToggleProperty(const PropertyKey& key) {
  return detail::IsToggleKey(detail::Narrow(key.GetString()));
}

RunValue ResolveRunProperty(const StyleSheet& sheet, const RunStyles& styles,
                            const PropertyKey& key) {
  static const PropertyKey characterKey(u"character");
  RunValue result;
  // The document defaults come first: the defaults style of characters.
  if (const Style* defaults = sheet.GetStyle(DefaultsStyleName(characterKey))) {
    const Tools::Resolution base = Tools::ResolveProperty(*defaults, key);
    result.value = *base.value;
    result.source = base.holder;
  }
  const auto substyle = [](const Style* style, const PropertyKey& property) -> const Style* {
    if (!style)
      return nullptr;
    const Any& value = *Tools::ResolveProperty(*style, property).value;
    const Style* const* held = value.GetIf<Style*>();
    return held ? *held : nullptr;
  };
  const auto levelStyle = [&](const Style* style) -> const Style* {
    if (!style || style->GetCategoryName() == characterKey)
      return style;
    return substyle(style, characterKey);
  };
  // What one level sets: the nearest own value along its chain, where the
  // chain is not the defaults' own.
  const auto levelValue = [&](const Style* level) -> Tools::Resolution {
    Tools::Resolution found;
    if (!level)
      return found;
    found = Tools::ResolveProperty(*level, key);
    if (result.value.IsEmpty() && !found.holder)
      result.value = *found.value; // the category default, when no defaults style exists
    if (IsPartStyle(sheet, found.holder))
      found.holder = nullptr;
    return found;
  };

  Tools::Resolution table = levelValue(levelStyle(styles.table));
  // The cell's conditional formats set what they set over the whole table.
  for (const PropertyKey& format : styles.formats) {
    const Tools::Resolution conditional = levelValue(levelStyle(substyle(styles.table, format)));
    if (conditional.holder)
      table = conditional;
  }
  const bool toggle = IsToggleProperty(key);
  for (const Tools::Resolution& found : {table, levelValue(levelStyle(styles.paragraph)),
                                         levelValue(levelStyle(styles.character))}) {
    if (!found.holder)
      continue;
    if (!toggle) {
      result.value = *found.value;
      result.source = found.holder;
      continue;
    }
    const bool* on = found.value->GetIf<bool>();
    const bool* current = result.value.GetIf<bool>();
    if (on && *on) {
      result.value = Any(!(current && *current));
      result.source = found.holder;
    }
  }
  return result;
}

} // namespace Word
} // namespace Styles
