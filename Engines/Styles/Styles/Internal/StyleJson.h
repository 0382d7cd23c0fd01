// One style's JSON object: writing its members (to a value tree or straight
// into text) and reading them back, parent names resolved in a sheet. Used by
// Style's own JSON operations and by the document reader and writer.
#pragma once

#include <Styles/Style.h>

#include <Json/Json.h>

#include <cstddef>
#include <string_view>

namespace Styles {
namespace detail {

class StyleJson {
public:
  // What reading styles keeps from one style to the next: a value reused for
  // members, and how each behaviour met reads a string value, found once by
  // its type (behaviours live unchanged through one import).
  class ReadScratch {
  public:
    enum Kind : unsigned char { kUnknown, kGeneral, kText, kNumber, kSubstyle, kSubstyleList };
    JsonValue value;
    // How a behaviour's Deserialize is known to read: kText or kNumber for an
    // exact StyleProperty with the stock text or number policy, kSubstyle and
    // kSubstyleList for an exact StyleSetProperty and StyleArrayProperty;
    // kGeneral for any other.
    Kind KindOf(const BaseStyleProperty& behaviour);

  private:
    static constexpr std::size_t kSlots = 64;
    const BaseStyleProperty* m_behaviours[kSlots] = {};
    Kind m_kinds[kSlots] = {};
  };
  // Reads the members of a style's object, held as Access describes it (a
  // value tree or a compact document), into `style`; `scratch` is reused.
  // Exceptions of behaviours pass through.
  template <class Access>
  static void Read(Style& style, const StyleSheet& sheet, const typename Access::Object& object,
                   ReadScratch& scratch);
  // Fills `out` with the style's object as a value tree.
  static void Write(const Style& style, const StyleSheet& sheet, JsonValue& out,
                    bool includeTemporary);
  // What writing a document's styles as text keeps from one style to the
  // next: a value reused for members, and how each behaviour met is written,
  // found once by its type (behaviours live unchanged through one export).
  class TextScratch {
  public:
    enum Kind : unsigned char { kUnknown, kGeneral, kText, kNumber };
    JsonValue value;
    // How `behaviour` is written: by its Serialize, or as a plain text or
    // number property of the stock policies.
    Kind KindOf(const BaseStyleProperty& behaviour);

  private:
    static constexpr std::size_t kSlots = 64;
    const BaseStyleProperty* m_behaviours[kSlots] = {};
    Kind m_kinds[kSlots] = {};
  };
  // Writes the style's object as text.
  static void Write(const Style& style, const StyleSheet& sheet, Json::Writer& writer,
                    bool includeTemporary, TextScratch& scratch);

private:
  // What the Deserialize of a behaviour of kind kSubstyle or kSubstyleList
  // does, read from the object or array where it is. False for a value of
  // another form, which the general way takes.
  template <class Access>
  static bool ReadSubstyles(ReadScratch::Kind kind, const BaseStyleProperty& behaviour,
                            Style& style, const StyleSheet& sheet, typename Access::Value value,
                            ReadScratch& scratch);
  // Hands the members of the style's object to `sink`, in their order.
  template <class Sink>
  static void WriteMembers(const Style& style, const StyleSheet& sheet, bool includeTemporary,
                           Sink& sink);
  // The style that an "inherits" member names, after the manager's import
  // settings: null for a name they say to ignore, or a name the sheet lacks.
  static Style* ResolveParent(const StyleSheet& sheet, std::u16string_view name);
};

} // namespace detail
} // namespace Styles
