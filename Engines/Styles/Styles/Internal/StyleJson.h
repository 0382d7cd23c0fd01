// One style's JSON object: writing its members (to a value tree or straight
// into text) and reading them back, parent names resolved in a sheet. Used by
// Style's own JSON operations and by the document reader and writer.
#pragma once

#include <Styles/Style.h>

#include <Json/Json.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <string_view>
#include <vector>

namespace Styles {
namespace detail {

class StyleJson {
public:
  // What a behaviour is known to read and write without its virtual calls:
  // kText or kNumber for an exact StyleProperty with the stock text or number
  // policy, kSubstyle and kSubstyleList for an exact StyleSetProperty and
  // StyleArrayProperty; kGeneral for any other.
  enum Kind : unsigned char { kGeneral, kText, kNumber, kSubstyle, kSubstyleList };
  static Kind KindOf(const BaseStyleProperty& behaviour);

  // What reading styles keeps from one style to the next: a value reused for
  // members, and the kind of each behaviour met, found once (behaviours live
  // unchanged through one import).
  class ReadScratch {
  public:
    JsonValue value;
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
  // next: a value reused for members, the plain members waiting to be written
  // in one call, and how the value under each key of each category is
  // written, found once (behaviours live unchanged through one export).
  class TextScratch {
  public:
    // How a key's value is written: not at all (no behaviour), or as its
    // behaviour's kind says.
    struct Plan {
      const BaseStyleProperty* behaviour;
      Kind kind;
      std::u16string_view quotedName; // the key as Json::Writer::Quote gives it
    };

    TextScratch(const StyleSheet& sheet, bool includeTemporary)
        : m_sheet(sheet), m_includeTemporary(includeTemporary) {}
    // The plan for `key` in a style of `category` (null for none).
    Plan PlanFor(const StyleCategory* category, const PropertyKey& key) {
      const std::size_t mask = m_slots.size() - 1;
      for (std::size_t i = Hash(category, key) & mask;; i = (i + 1) & mask) {
        const Slot& slot = m_slots[i];
        if (!slot.filled)
          return Learn(category, key);
        if (slot.category == category && slot.key == key)
          return slot.plan;
      }
    }

    JsonValue value;
    static constexpr std::size_t kBatch = 32;
    Json::Writer::StringMember pending[kBatch];
    char16_t digits[kBatch][32];

  private:
    struct Slot {
      const StyleCategory* category = nullptr;
      PropertyKey key;
      Plan plan = {nullptr, kGeneral, {}};
      bool filled = false;
    };
    static std::size_t Hash(const StyleCategory* category, const PropertyKey& key) {
      const auto bits = reinterpret_cast<std::uintptr_t>(category) ^ key.getHash();
      return static_cast<std::size_t>(((bits >> 4) * 0x9E3779B97F4A7C15ull) >> 40);
    }
    // Finds the plan of a key met for the first time and files it.
    Plan Learn(const StyleCategory* category, const PropertyKey& key);
    void Place(const Slot& slot);

    const StyleSheet& m_sheet;
    bool m_includeTemporary;
    std::vector<Slot> m_slots = std::vector<Slot>(64); // half full at most
    std::deque<ZelStringT<char16_t>> m_quotedNames;    // a deque never moves them
    std::size_t m_filled = 0;
  };
  // Writes the style's object as text.
  static void Write(const Style& style, const StyleSheet& sheet, Json::Writer& writer,
                    bool includeTemporary, TextScratch& scratch);

private:
  // What the Deserialize of a behaviour of kind kSubstyle or kSubstyleList
  // does, read from the object or array where it is. False for a value of
  // another form, which the general way takes.
  template <class Access>
  static bool ReadSubstyles(Kind kind, const BaseStyleProperty& behaviour,
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
