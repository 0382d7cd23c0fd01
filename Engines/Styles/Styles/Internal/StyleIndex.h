// The name index: a sheet's styles by case-folded name, by pointer and in
// name order. Owned by the sheet; the document reader and writer walk it.
#pragma once

#include <Styles/Internal/EntryTable.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace Styles {

class Style;

namespace detail {

// Grows `values` geometrically so that one more push_back cannot throw.
template <class T> void MakeRoomForOne(std::vector<T>& values) {
  if (values.size() == values.capacity())
    values.reserve(values.size() * 2 + 8);
}

// A name is case-folded once, when it is filed, and looked up by a hash of
// its folding, so finding a style costs one folding of the asked name
// whatever the sheet's size. Name order is a sorted list that new names join
// when the order is next asked for. The index never owns the styles.
class StyleIndex {
public:
  // One filed style. Its name as spelled and the name's folding share one
  // block; a name that is its own folding is kept once.
  struct Entry {
    Style* style = nullptr;
    std::unique_ptr<char16_t[]> text;
    std::uint32_t nameLength = 0;
    std::uint32_t foldedStart = 0;
    std::uint32_t foldedLength = 0;
    std::uint32_t importStamp = 0; // the import that filed the style held here
    std::uint32_t position = 0;    // where the entry sits in the index's deque
    bool listed = true;            // in the name index (and so in name order)
    bool erased = false;

    std::u16string_view Name() const noexcept { return {text.get(), nameLength}; }
    std::u16string_view Folded() const noexcept { return {text.get() + foldedStart, foldedLength}; }
  };

  // The entry filed under `name` in any letter case, or null.
  Entry* Find(std::u16string_view name) const {
    thread_local std::u16string folded;
    ZelPlatform::detail::FoldCaseUtf16(name, folded);
    return FindFolded(folded);
  }
  // The same for a name already folded.
  Entry* FindFolded(std::u16string_view folded) const {
    return m_byName.Find(folded, HashName(folded));
  }
  // The entry of `style`, also when its name was dropped; null for null.
  Entry* Find(const Style* style) const {
    return style ? m_byStyle.Find(style, HashStyle(style)) : nullptr;
  }
  std::size_t Size() const noexcept { return m_byName.Size(); }
  // A number that no earlier import was given, to mark what this one files.
  std::uint32_t NextImportStamp() noexcept { return ++m_importStamps; }
  void Reserve(std::size_t count) {
    m_byName.Reserve(count);
    m_byStyle.Reserve(count);
  }

  // Files `style` under `name`, which no entry holds; `style` must not be in
  // the index. Both indexes are unchanged when this throws.
  Entry* Add(std::u16string_view name, Style* style);
  // The same for a name whose folding is known.
  Entry* Add(std::u16string_view name, std::u16string_view folded, Style* style);
  // Files `style` under `name` with one search. `previous` receives the style
  // replaced (detached, not destroyed). Returns the entry filed under `name`
  // and whether `style` went in; when it did not (a clash without `replace`),
  // `style` is still the caller's to destroy. When this throws, `style` has
  // been destroyed: a sheet owns what it is offered.
  std::pair<Entry*, bool> File(std::u16string_view name, Style* style, bool replace,
                               Style*& previous);
  // Files `style` in place of the entry's style, under `spelling`, which
  // folds as the entry's name does.
  void Replace(Entry* entry, std::u16string_view spelling, Style* style);
  // Takes the entry out of both indexes; its slot is reused later.
  void Erase(Entry* entry);
  // Drops every name; the styles stay known by pointer.
  void DropNames();
  // The listed entries in name order.
  const std::vector<Entry*>& Ordered() const;
  // Every style, listed ones in name order first, then those known only by
  // pointer; the index is left empty.
  std::vector<Style*> TakeStyles();

private:
  struct FoldedOf {
    std::u16string_view operator()(const Entry& entry) const { return entry.Folded(); }
  };
  struct StyleOf {
    const Style* operator()(const Entry& entry) const { return entry.style; }
  };
  // One block holding `name`, then `folded` unless it equals the name.
  static std::unique_ptr<char16_t[]> Spell(std::u16string_view name, std::u16string_view folded);
  static std::size_t HashName(std::u16string_view folded) {
    return std::hash<std::u16string_view>()(folded);
  }
  static std::size_t HashStyle(const Style* style) {
    // Addresses are multiples of the allocation alignment; mix the bits.
    return static_cast<std::size_t>((reinterpret_cast<std::uintptr_t>(style) >> 4) *
                                    0x9E3779B97F4A7C15ull);
  }

  mutable std::deque<Entry> m_entries;   // every entry; a deque never moves them
  mutable std::vector<Entry*> m_free;    // erased entries ready for reuse
  mutable std::vector<Entry*> m_ordered; // listed entries in name order
  mutable std::vector<Entry*> m_pending; // filed since the last ordering
  mutable bool m_stale = false;          // names dropped since then
  mutable std::size_t m_erased = 0;
  std::uint32_t m_importStamps = 0;
  EntryTable<Entry, FoldedOf> m_byName{m_entries};
  EntryTable<Entry, StyleOf> m_byStyle{m_entries};
};

} // namespace detail
} // namespace Styles
