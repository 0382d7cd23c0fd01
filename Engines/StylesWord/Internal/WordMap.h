// The table that maps the elements and attributes of a styles part onto the
// properties of the Word schema, with the unit of each value. Reader, writer
// and schema all work from it. Never installed.
#pragma once

#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Any.h>

#include <pugixml.hpp>

#include <map>
#include <string>
#include <vector>

namespace Styles {
namespace Word {
namespace detail {

using Text = ZelStringT<char16_t>;

/// How an attribute's text becomes a value and back.
enum class Unit {
  Text,         // kept as written
  OnOff,        // a flag; on the "w:val" of an element, the element alone means true
  Integer,      // a whole number
  Twips,        // twentieths of a point, held in points
  HalfPoints,   // held in points
  EighthPoints, // held in points
  Points,       // whole points
  Colour,       // "RRGGBB" held as "#RRGGBB"; "auto" kept as it is
  LineSpacing,  // 240ths of a line under the "auto" rule (held in lines), else twips
  Width         // a table measure: twips under "dxa", fiftieths of a percent under "pct"
};

/// The element of a style that holds a value.
enum class Container { Style, Paragraph, Run, Table, Row, Cell };

/// One value: attribute `attribute` of `element` ("w:pBdr/w:top" reaches one
/// level down) inside `container`, held under `key`. For a font, `theme` names
/// the attribute whose theme font stands in when the attribute is missing.
struct Field {
  Container container;
  const char* element;
  const char* attribute;
  const char* key;
  Unit unit;
  const char* theme = nullptr;
};

/// The fields that live in one child element of a container, in table order.
struct Group {
  Container container;
  std::string element;            // the child's name, "w:spacing"
  std::vector<std::string> inner; // names of nested elements, in writing order
  std::vector<const Field*> fields;
  std::vector<PropertyKey> keys;   // each field's key
  std::vector<std::string> nested; // each field's nested element, or ""
};

/// Every field, grouped by container and element.
const std::vector<Group>& Groups();
/// The group of `element` in `container`, or null.
const Group* FindGroup(Container container, std::string_view element);
/// The keys of the toggle properties of runs.
bool IsToggleKey(std::string_view key);

/// The conditional formats of table styles, in writing order; null-terminated.
const char* const* ConditionalFormats();
/// Whether `type` names a conditional format.
bool IsConditionalFormat(std::string_view type);

/// The key that keeps a container's unmapped children as XML text; it is set
/// (maybe to "") whenever the container element is present.
const char* RawKey(Container container);
/// RawKey as an interned key.
const PropertyKey& RawPropertyKey(Container container);
/// The rank of a child element name in its container's schema order; -1 for a
/// name the order does not know.
int ChildRank(Container container, std::string_view element);

/// Theme fonts by reference ("minorHAnsi" -> "Calibri").
using ThemeFonts = std::map<std::string, std::string>;

/// Values read from one element, by key.
using Values = std::vector<std::pair<PropertyKey, ZelUtils::Any>>;

/// Reads the fields of `group` from `element`. False, with `problem` naming
/// the attribute, when an attribute is not of its unit's form.
bool ReadGroup(const Group& group, const pugi::xml_node& element, const ThemeFonts& theme,
               Values& out, std::string& problem);
/// Appends to `parent` the element of `group` built from the own values of
/// `style`; nothing when the style sets none of its keys. Values of the wrong
/// kind are left out.
void WriteGroup(const Group& group, const Style& style, const ThemeFonts& theme,
                pugi::xml_node parent);
/// Whether the style's own values of the group's keys are exactly `values`.
bool SameOwnValues(const Group& group, const Style& style, const Values& values);

/// Whether two elements are equal as canonical XML: same names, the same
/// attributes in any order, the same children and text.
bool SameNode(const pugi::xml_node& a, const pugi::xml_node& b);
/// The element as raw XML text, returned or appended to `out`.
std::string NodeText(const pugi::xml_node& node);
void AppendNodeText(const pugi::xml_node& node, std::string& out);

/// UTF-8 and UTF-16.
Text Widen(std::string_view text);
std::string Narrow(const Text& text);

} // namespace detail
} // namespace Word
} // namespace Styles
