#include <Internal/WordMap.h>

#include <algorithm>
#include <cmath>
#include <cstring>

namespace Styles {
namespace Word {
namespace detail {

using ZelUtils::Any;

namespace {

using C = Container;
using U = Unit;

// Borders of one side: style, width, space and colour, in attribute order.
#define STYLES_WORD_BORDER(container, element, prefix)                                             \
  {container, element, "w:val", prefix "Style", U::Text},                                          \
      {container, element, "w:sz", prefix "Width", U::EighthPoints},                               \
      {container, element, "w:space", prefix "Space", U::Points}, {                                \
    container, element, "w:color", prefix "Colour", U::Colour                                      \
  }
#define STYLES_WORD_SHADING(container, prefix)                                                     \
  {container, "w:shd", "w:val", prefix "Pattern", U::Text},                                        \
      {container, "w:shd", "w:color", prefix "Colour", U::Colour}, {                               \
    container, "w:shd", "w:fill", prefix "Fill", U::Colour                                         \
  }
// A measure: its type first, since the width's unit depends on it.
#define STYLES_WORD_MEASURE(container, element, key)                                               \
  {container, element, "w:type", key "Type", U::Text}, { container, element, "w:w", key, U::Width }

const Field kFields[] = {
    // The style's own data.
    {C::Style, "", "w:default", "isDefault", U::OnOff},
    {C::Style, "", "w:customStyle", "custom", U::OnOff},
    {C::Style, "w:aliases", "w:val", "aliases", U::Text},
    {C::Style, "w:next", "w:val", "next", U::Text},
    {C::Style, "w:link", "w:val", "link", U::Text},
    {C::Style, "w:autoRedefine", "w:val", "autoRedefine", U::OnOff},
    {C::Style, "w:hidden", "w:val", "hidden", U::OnOff},
    {C::Style, "w:uiPriority", "w:val", "priority", U::Integer},
    {C::Style, "w:semiHidden", "w:val", "semiHidden", U::OnOff},
    {C::Style, "w:unhideWhenUsed", "w:val", "unhideWhenUsed", U::OnOff},
    {C::Style, "w:qFormat", "w:val", "quickFormat", U::OnOff},
    {C::Style, "w:locked", "w:val", "locked", U::OnOff},

    // Paragraphs.
    {C::Paragraph, "w:keepNext", "w:val", "keepWithNext", U::OnOff},
    {C::Paragraph, "w:keepLines", "w:val", "keepLinesTogether", U::OnOff},
    {C::Paragraph, "w:pageBreakBefore", "w:val", "pageBreakBefore", U::OnOff},
    {C::Paragraph, "w:widowControl", "w:val", "widowControl", U::OnOff},
    {C::Paragraph, "w:numPr/w:ilvl", "w:val", "numberingLevel", U::Integer},
    {C::Paragraph, "w:numPr/w:numId", "w:val", "numberingId", U::Integer},
    STYLES_WORD_BORDER(C::Paragraph, "w:pBdr/w:top", "borderTop"),
    STYLES_WORD_BORDER(C::Paragraph, "w:pBdr/w:left", "borderLeft"),
    STYLES_WORD_BORDER(C::Paragraph, "w:pBdr/w:bottom", "borderBottom"),
    STYLES_WORD_BORDER(C::Paragraph, "w:pBdr/w:right", "borderRight"),
    STYLES_WORD_BORDER(C::Paragraph, "w:pBdr/w:between", "borderBetween"),
    STYLES_WORD_SHADING(C::Paragraph, "shading"),
    {C::Paragraph, "w:spacing", "w:before", "spaceBefore", U::Twips},
    {C::Paragraph, "w:spacing", "w:beforeAutospacing", "spaceBeforeAuto", U::OnOff},
    {C::Paragraph, "w:spacing", "w:after", "spaceAfter", U::Twips},
    {C::Paragraph, "w:spacing", "w:afterAutospacing", "spaceAfterAuto", U::OnOff},
    {C::Paragraph, "w:spacing", "w:lineRule", "lineSpacingRule", U::Text},
    {C::Paragraph, "w:spacing", "w:line", "lineSpacing", U::LineSpacing},
    {C::Paragraph, "w:ind", "w:left", "indentLeft", U::Twips},
    {C::Paragraph, "w:ind", "w:start", "indentStart", U::Twips},
    {C::Paragraph, "w:ind", "w:right", "indentRight", U::Twips},
    {C::Paragraph, "w:ind", "w:end", "indentEnd", U::Twips},
    {C::Paragraph, "w:ind", "w:firstLine", "indentFirstLine", U::Twips},
    {C::Paragraph, "w:ind", "w:hanging", "indentHanging", U::Twips},
    {C::Paragraph, "w:contextualSpacing", "w:val", "contextualSpacing", U::OnOff},
    {C::Paragraph, "w:jc", "w:val", "alignment", U::Text},
    {C::Paragraph, "w:outlineLvl", "w:val", "outlineLevel", U::Integer},

    // Runs. Theme references come before the names they stand in for.
    {C::Run, "w:rFonts", "w:asciiTheme", "fontAsciiTheme", U::Text},
    {C::Run, "w:rFonts", "w:hAnsiTheme", "fontHighAnsiTheme", U::Text},
    {C::Run, "w:rFonts", "w:eastAsiaTheme", "fontEastAsiaTheme", U::Text},
    {C::Run, "w:rFonts", "w:cstheme", "fontComplexTheme", U::Text},
    {C::Run, "w:rFonts", "w:ascii", "fontAscii", U::Text, "w:asciiTheme"},
    {C::Run, "w:rFonts", "w:hAnsi", "fontHighAnsi", U::Text, "w:hAnsiTheme"},
    {C::Run, "w:rFonts", "w:eastAsia", "fontEastAsia", U::Text, "w:eastAsiaTheme"},
    {C::Run, "w:rFonts", "w:cs", "fontComplex", U::Text, "w:cstheme"},
    {C::Run, "w:rFonts", "w:hint", "fontHint", U::Text},
    {C::Run, "w:b", "w:val", "bold", U::OnOff},
    {C::Run, "w:bCs", "w:val", "boldComplex", U::OnOff},
    {C::Run, "w:i", "w:val", "italic", U::OnOff},
    {C::Run, "w:iCs", "w:val", "italicComplex", U::OnOff},
    {C::Run, "w:caps", "w:val", "caps", U::OnOff},
    {C::Run, "w:smallCaps", "w:val", "smallCaps", U::OnOff},
    {C::Run, "w:strike", "w:val", "strike", U::OnOff},
    {C::Run, "w:dstrike", "w:val", "doubleStrike", U::OnOff},
    {C::Run, "w:outline", "w:val", "outline", U::OnOff},
    {C::Run, "w:shadow", "w:val", "shadow", U::OnOff},
    {C::Run, "w:emboss", "w:val", "emboss", U::OnOff},
    {C::Run, "w:imprint", "w:val", "imprint", U::OnOff},
    {C::Run, "w:noProof", "w:val", "noProof", U::OnOff},
    {C::Run, "w:vanish", "w:val", "vanish", U::OnOff},
    {C::Run, "w:color", "w:val", "colour", U::Colour},
    {C::Run, "w:color", "w:themeColor", "colourTheme", U::Text},
    {C::Run, "w:color", "w:themeTint", "colourThemeTint", U::Text},
    {C::Run, "w:color", "w:themeShade", "colourThemeShade", U::Text},
    {C::Run, "w:spacing", "w:val", "characterSpacing", U::Twips},
    {C::Run, "w:w", "w:val", "characterScale", U::Integer},
    {C::Run, "w:kern", "w:val", "kerning", U::HalfPoints},
    {C::Run, "w:position", "w:val", "position", U::HalfPoints},
    {C::Run, "w:sz", "w:val", "fontSize", U::HalfPoints},
    {C::Run, "w:szCs", "w:val", "fontSizeComplex", U::HalfPoints},
    {C::Run, "w:highlight", "w:val", "highlight", U::Text},
    {C::Run, "w:u", "w:val", "underline", U::Text},
    {C::Run, "w:u", "w:color", "underlineColour", U::Colour},
    STYLES_WORD_SHADING(C::Run, "shading"),
    {C::Run, "w:vertAlign", "w:val", "verticalAlignment", U::Text},
    {C::Run, "w:rtl", "w:val", "rightToLeft", U::OnOff},
    {C::Run, "w:lang", "w:val", "language", U::Text},
    {C::Run, "w:lang", "w:eastAsia", "languageEastAsia", U::Text},
    {C::Run, "w:lang", "w:bidi", "languageComplex", U::Text},

    // Tables, their rows and cells.
    {C::Table, "w:tblStyleRowBandSize", "w:val", "rowBandSize", U::Integer},
    {C::Table, "w:tblStyleColBandSize", "w:val", "columnBandSize", U::Integer},
    {C::Table, "w:jc", "w:val", "tableAlignment", U::Text},
    STYLES_WORD_MEASURE(C::Table, "w:tblInd", "tableIndent"),
    STYLES_WORD_BORDER(C::Table, "w:tblBorders/w:top", "tableBorderTop"),
    STYLES_WORD_BORDER(C::Table, "w:tblBorders/w:left", "tableBorderLeft"),
    STYLES_WORD_BORDER(C::Table, "w:tblBorders/w:bottom", "tableBorderBottom"),
    STYLES_WORD_BORDER(C::Table, "w:tblBorders/w:right", "tableBorderRight"),
    STYLES_WORD_BORDER(C::Table, "w:tblBorders/w:insideH", "tableBorderInsideH"),
    STYLES_WORD_BORDER(C::Table, "w:tblBorders/w:insideV", "tableBorderInsideV"),
    STYLES_WORD_SHADING(C::Table, "tableShading"),
    STYLES_WORD_MEASURE(C::Table, "w:tblCellMar/w:top", "cellMarginTop"),
    STYLES_WORD_MEASURE(C::Table, "w:tblCellMar/w:left", "cellMarginLeft"),
    STYLES_WORD_MEASURE(C::Table, "w:tblCellMar/w:bottom", "cellMarginBottom"),
    STYLES_WORD_MEASURE(C::Table, "w:tblCellMar/w:right", "cellMarginRight"),
    {C::Row, "w:cantSplit", "w:val", "rowCantSplit", U::OnOff},
    {C::Row, "w:tblHeader", "w:val", "rowHeader", U::OnOff},
    {C::Row, "w:jc", "w:val", "rowAlignment", U::Text},
    STYLES_WORD_SHADING(C::Cell, "cellShading"),
    {C::Cell, "w:noWrap", "w:val", "cellNoWrap", U::OnOff},
    {C::Cell, "w:vAlign", "w:val", "cellVerticalAlignment", U::Text},
};

#undef STYLES_WORD_BORDER
#undef STYLES_WORD_SHADING
#undef STYLES_WORD_MEASURE

// Children of each container in the order the file format prescribes.
const std::vector<std::vector<const char*>>& Orders() {
  static const std::vector<std::vector<const char*>> orders = {
      // Style
      {"w:name",          "w:aliases",
       "w:basedOn",       "w:next",
       "w:link",          "w:autoRedefine",
       "w:hidden",        "w:uiPriority",
       "w:semiHidden",    "w:unhideWhenUsed",
       "w:qFormat",       "w:locked",
       "w:personal",      "w:personalCompose",
       "w:personalReply", "w:rsid",
       "w:pPr",           "w:rPr",
       "w:tblPr",         "w:trPr",
       "w:tcPr",          "w:tblStylePr"},
      // Paragraph
      {"w:pStyle",
       "w:keepNext",
       "w:keepLines",
       "w:pageBreakBefore",
       "w:framePr",
       "w:widowControl",
       "w:numPr",
       "w:suppressLineNumbers",
       "w:pBdr",
       "w:shd",
       "w:tabs",
       "w:suppressAutoHyphens",
       "w:kinsoku",
       "w:wordWrap",
       "w:overflowPunct",
       "w:topLinePunct",
       "w:autoSpaceDE",
       "w:autoSpaceDN",
       "w:bidi",
       "w:adjustRightInd",
       "w:snapToGrid",
       "w:spacing",
       "w:ind",
       "w:contextualSpacing",
       "w:mirrorIndents",
       "w:suppressOverlap",
       "w:jc",
       "w:textDirection",
       "w:textAlignment",
       "w:textboxTightWrap",
       "w:outlineLvl",
       "w:divId",
       "w:cnfStyle",
       "w:rPr",
       "w:sectPr",
       "w:pPrChange"},
      // Run
      {"w:rStyle",
       "w:rFonts",
       "w:b",
       "w:bCs",
       "w:i",
       "w:iCs",
       "w:caps",
       "w:smallCaps",
       "w:strike",
       "w:dstrike",
       "w:outline",
       "w:shadow",
       "w:emboss",
       "w:imprint",
       "w:noProof",
       "w:snapToGrid",
       "w:vanish",
       "w:webHidden",
       "w:color",
       "w:spacing",
       "w:w",
       "w:kern",
       "w:position",
       "w:sz",
       "w:szCs",
       "w:highlight",
       "w:u",
       "w:effect",
       "w:bdr",
       "w:shd",
       "w:fitText",
       "w:vertAlign",
       "w:rtl",
       "w:cs",
       "w:em",
       "w:lang",
       "w:eastAsianLayout",
       "w:specVanish",
       "w:oMath",
       "w:rPrChange"},
      // Table
      {"w:tblStyle", "w:tblpPr", "w:tblOverlap", "w:bidiVisual", "w:tblStyleRowBandSize",
       "w:tblStyleColBandSize", "w:tblW", "w:jc", "w:tblCellSpacing", "w:tblInd", "w:tblBorders",
       "w:shd", "w:tblLayout", "w:tblCellMar", "w:tblLook", "w:tblCaption", "w:tblDescription",
       "w:tblPrChange"},
      // Row
      {"w:cnfStyle", "w:divId", "w:gridBefore", "w:gridAfter", "w:wBefore", "w:wAfter",
       "w:cantSplit", "w:trHeight", "w:tblHeader", "w:tblCellSpacing", "w:jc", "w:hidden", "w:ins",
       "w:del", "w:trPrChange"},
      // Cell
      {"w:cnfStyle", "w:tcW", "w:gridSpan", "w:hMerge", "w:vMerge", "w:tcBorders", "w:shd",
       "w:noWrap", "w:tcMar", "w:textDirection", "w:tcFitText", "w:vAlign", "w:hideMark",
       "w:headers", "w:cellIns", "w:cellDel", "w:cellMerge", "w:tcPrChange"},
  };
  return orders;
}

bool ParseInteger(std::string_view text, long long& out) {
  if (text.empty() || text.size() > 18)
    return false;
  std::size_t i = text[0] == '-' || text[0] == '+' ? 1 : 0;
  if (i == text.size())
    return false;
  long long value = 0;
  for (std::size_t j = i; j < text.size(); ++j) {
    if (text[j] < '0' || text[j] > '9')
      return false;
    value = value * 10 + (text[j] - '0');
  }
  out = text[0] == '-' ? -value : value;
  return true;
}

bool ParseOnOff(std::string_view text, bool& out) {
  for (const char* on : {"1", "true", "on"})
    if (text == on)
      return out = true, true;
  for (const char* off : {"0", "false", "off"})
    if (text == off)
      return out = false, true;
  return false;
}

std::string IntegerText(double number) { return std::to_string(std::llround(number)); }

// The scale from the unit to the held number; 0 for units that are not one.
double Scale(Unit unit, const pugi::xml_node& element) {
  switch (unit) {
  case U::Twips:
    return 20;
  case U::HalfPoints:
    return 2;
  case U::EighthPoints:
    return 8;
  case U::Points:
    return 1;
  case U::LineSpacing: {
    const std::string_view rule = element.attribute("w:lineRule").value();
    return rule.empty() || rule == "auto" ? 240 : 20;
  }
  case U::Width: {
    const std::string_view type = element.attribute("w:type").value();
    return type == "pct" ? 50 : type.empty() || type == "dxa" ? 20 : 1;
  }
  default:
    return 0;
  }
}

bool ReadValue(Unit unit, const pugi::xml_node& element, std::string_view text, Any& out) {
  switch (unit) {
  case U::Text:
    out = Any(Widen(text));
    return true;
  case U::OnOff: {
    bool flag = false;
    if (!ParseOnOff(text, flag))
      return false;
    out = Any(flag);
    return true;
  }
  case U::Integer: {
    long long number = 0;
    if (!ParseInteger(text, number) || number < INT32_MIN || number > INT32_MAX)
      return false;
    out = Any(static_cast<int>(number));
    return true;
  }
  case U::Colour:
    out = Any(text == "auto" ? Text(u"auto") : Text(u"#") + Widen(text));
    return true;
  default: {
    long long number = 0;
    if (!ParseInteger(text, number))
      return false;
    out = Any(static_cast<double>(number) / Scale(unit, element));
    return true;
  }
  }
}

bool WriteValue(Unit unit, const Any& value, const pugi::xml_node& element, std::string& out) {
  switch (unit) {
  case U::Text: {
    const Text* text = value.GetIf<Text>();
    return text && (out = Narrow(*text), true);
  }
  case U::OnOff: {
    const bool* flag = value.GetIf<bool>();
    return flag && (out = *flag ? "1" : "0", true);
  }
  case U::Integer: {
    const int* number = value.GetIf<int>();
    return number && (out = std::to_string(*number), true);
  }
  case U::Colour: {
    const Text* text = value.GetIf<Text>();
    if (!text)
      return false;
    const std::string colour = Narrow(*text);
    out = !colour.empty() && colour[0] == '#' ? colour.substr(1) : colour;
    return true;
  }
  default: {
    const double* number = value.GetIf<double>();
    if (!number || !std::isfinite(*number) || std::fabs(*number) > 1e12)
      return false;
    out = IntegerText(*number * Scale(unit, element));
    return true;
  }
  }
}

std::vector<std::string> SplitPath(const char* element) {
  std::vector<std::string> parts;
  std::string_view path(element);
  const std::size_t slash = path.find('/');
  parts.emplace_back(path.substr(0, slash));
  if (slash != std::string_view::npos)
    parts.emplace_back(path.substr(slash + 1));
  return parts;
}

// The element of a field below the group's element, or the element itself.
pugi::xml_node FieldNode(const pugi::xml_node& element, const std::string& nested) {
  return nested.empty() ? element : element.child(nested.c_str());
}

} // namespace

const std::vector<Group>& Groups() {
  static const std::vector<Group> groups = [] {
    std::vector<Group> made;
    for (const Field& field : kFields) {
      const std::vector<std::string> parts = SplitPath(field.element);
      auto group = std::find_if(made.begin(), made.end(), [&](const Group& g) {
        return g.container == field.container && g.element == parts[0];
      });
      if (group == made.end()) {
        made.push_back(Group{field.container, parts[0], {}, {}, {}, {}});
        group = made.end() - 1;
      }
      if (parts.size() > 1 &&
          std::find(group->inner.begin(), group->inner.end(), parts[1]) == group->inner.end())
        group->inner.push_back(parts[1]);
      group->fields.push_back(&field);
      group->keys.emplace_back(Widen(field.key));
      group->nested.push_back(parts.size() > 1 ? parts[1] : std::string());
    }
    return made;
  }();
  return groups;
}

const Group* FindGroup(Container container, std::string_view element) {
  for (const Group& group : Groups())
    if (group.container == container && group.element == element)
      return &group;
  return nullptr;
}

bool IsToggleKey(std::string_view key) {
  static const char* const kToggles[] = {
      "bold",         "boldComplex", "italic", "italicComplex", "caps",    "smallCaps", "strike",
      "doubleStrike", "outline",     "shadow", "emboss",        "imprint", "vanish"};
  return std::any_of(std::begin(kToggles), std::end(kToggles),
                     [&](const char* toggle) { return key == toggle; });
}

const char* const* ConditionalFormats() {
  static const char* const kFormats[] = {
      "wholeTable", "firstRow",  "lastRow", "firstCol", "lastCol", "band1Vert", "band2Vert",
      "band1Horz",  "band2Horz", "neCell",  "nwCell",   "seCell",  "swCell",    nullptr};
  return kFormats;
}

bool IsConditionalFormat(std::string_view type) {
  for (const char* const* format = ConditionalFormats(); *format; ++format)
    if (type == *format)
      return true;
  return false;
}

const char* RawKey(Container container) {
  switch (container) {
  case C::Style:
    return "styleXml";
  case C::Row:
    return "rowXml";
  case C::Cell:
    return "cellXml";
  default:
    return "xml";
  }
}

const PropertyKey& RawPropertyKey(Container container) {
  static const std::vector<PropertyKey> keys = [] {
    std::vector<PropertyKey> made;
    for (Container c : {C::Style, C::Paragraph, C::Run, C::Table, C::Row, C::Cell})
      made.emplace_back(Widen(RawKey(c)));
    return made;
  }();
  return keys[static_cast<std::size_t>(container)];
}

int ChildRank(Container container, std::string_view element) {
  const std::vector<const char*>& order = Orders()[static_cast<std::size_t>(container)];
  for (std::size_t i = 0; i < order.size(); ++i)
    if (element == order[i])
      return static_cast<int>(i);
  return -1;
}

bool ReadGroup(const Group& group, const pugi::xml_node& element, const ThemeFonts& theme,
               Values& out, std::string& problem) {
  for (std::size_t i = 0; i < group.fields.size(); ++i) {
    const Field* field = group.fields[i];
    const pugi::xml_node node = FieldNode(element, group.nested[i]);
    if (!node)
      continue;
    Any value;
    const pugi::xml_attribute attribute = node.attribute(field->attribute);
    if (field->unit == U::OnOff && std::strcmp(field->attribute, "w:val") == 0 && !attribute) {
      value = Any(true);
    } else if (!attribute) {
      if (!field->theme)
        continue;
      const auto font = theme.find(node.attribute(field->theme).value());
      if (font == theme.end() || font->second.empty())
        continue;
      value = Any(Widen(font->second));
    } else if (!ReadValue(field->unit, node, attribute.value(), value)) {
      problem = std::string(field->attribute) + " \"" + attribute.value() +
                "\" is not of the expected form";
      return false;
    }
    out.emplace_back(group.keys[i], std::move(value));
  }
  return true;
}

void WriteGroup(const Group& group, const Style& style, const ThemeFonts& theme,
                pugi::xml_node parent) {
  pugi::xml_node element;
  const auto nodeFor = [&](const std::string& nested) {
    if (!element)
      element = parent.append_child(group.element.c_str());
    if (nested.empty())
      return element;
    // Nested elements in the group's order, whatever order the values come in.
    pugi::xml_node child = element.child(nested.c_str());
    if (child)
      return child;
    const auto rank = std::find(group.inner.begin(), group.inner.end(), nested);
    for (pugi::xml_node next = element.first_child(); next; next = next.next_sibling())
      if (std::find(group.inner.begin(), rank, next.name()) == rank)
        return element.insert_child_before(nested.c_str(), next);
    return element.append_child(nested.c_str());
  };
  for (std::size_t i = 0; i < group.fields.size(); ++i) {
    const Field* field = group.fields[i];
    const Any* value = style.GetProperties().Find(group.keys[i]);
    if (!value)
      continue;
    std::string text;
    if (!WriteValue(field->unit, *value, element ? FieldNode(element, group.nested[i]) : element,
                    text))
      continue;
    pugi::xml_node node = nodeFor(group.nested[i]);
    if (field->theme && node.attribute(field->theme)) {
      // A name the theme reference stands for is not written beside it.
      const auto font = theme.find(node.attribute(field->theme).value());
      if (font != theme.end() && font->second == text)
        continue;
    }
    if (field->unit == U::OnOff && std::strcmp(field->attribute, "w:val") == 0) {
      if (text == "0")
        node.append_attribute("w:val").set_value("0");
      continue;
    }
    node.append_attribute(field->attribute).set_value(text.c_str());
  }
}

bool SameOwnValues(const Group& group, const Style& style, const Values& values) {
  for (const PropertyKey& key : group.keys) {
    const Any* own = style.GetProperties().Find(key);
    const auto read = std::find_if(values.begin(), values.end(),
                                   [&](const auto& entry) { return entry.first == key; });
    if ((own == nullptr) != (read == values.end()) || (own && !(*own == read->second)))
      return false;
  }
  return true;
}

namespace {

bool SameShallow(const pugi::xml_node& a, const pugi::xml_node& b) {
  if (a.type() != b.type() || std::strcmp(a.name(), b.name()) != 0 ||
      std::strcmp(a.value(), b.value()) != 0)
    return false;
  // The attributes as sorted lists of names and values, whatever their order.
  using Attributes = std::vector<std::pair<std::string_view, std::string_view>>;
  const auto sorted = [](const pugi::xml_node& node) {
    Attributes list;
    for (const pugi::xml_attribute attribute : node.attributes())
      list.emplace_back(attribute.name(), attribute.value());
    std::sort(list.begin(), list.end());
    return list;
  };
  return sorted(a) == sorted(b);
}

} // namespace

bool SameNode(const pugi::xml_node& a, const pugi::xml_node& b) {
  // A walk over both trees at once, in constant stack whatever the depth.
  if (!SameShallow(a, b))
    return false;
  pugi::xml_node x = a.first_child(), y = b.first_child();
  while (x || y) {
    if (!x || !y || !SameShallow(x, y))
      return false;
    if (x.first_child() || y.first_child()) {
      x = x.first_child();
      y = y.first_child();
      continue;
    }
    while (x && x != a && !x.next_sibling()) {
      if (y.next_sibling())
        return false;
      x = x.parent();
      y = y.parent();
    }
    if (x == a)
      return true;
    if (!y.next_sibling())
      return false;
    x = x.next_sibling();
    y = y.next_sibling();
  }
  return true;
}

void AppendNodeText(const pugi::xml_node& node, std::string& out) {
  struct Appender : pugi::xml_writer {
    explicit Appender(std::string& text) : text(text) {}
    void write(const void* data, std::size_t size) override {
      text.append(static_cast<const char*>(data), size);
    }
    std::string& text;
  } appender(out);
  node.print(appender, "", pugi::format_raw);
}

std::string NodeText(const pugi::xml_node& node) {
  std::string text;
  AppendNodeText(node, text);
  return text;
}

Text Widen(std::string_view text) { return Text(ZelPlatform::Utf8ToUtf16(text)); }

std::string Narrow(const Text& text) { return ZelPlatform::Utf16ToUtf8(text.GetView()); }

} // namespace detail
} // namespace Word
} // namespace Styles
