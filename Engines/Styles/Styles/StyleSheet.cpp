#include <Styles/StyleSheet.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>

#include <Styles/Internal/DocumentVersion.h>
#include <Styles/Internal/JsonAccess.h>

#include <Json/Json.h>
#include <ZelUtils/TextStream.h>

#include <algorithm>
#include <cassert>
#include <cstdint>
#include <deque>
#include <iterator>
#include <memory>
#include <optional>
#include <typeinfo>
#include <utility>

namespace Styles {

namespace {

// Member names of the document object.
constexpr char16_t k_strVersion[] = u"version";
constexpr char16_t k_strExternalID[] = u"id";

// The byte encoding of documents in streams, the same both ways.
constexpr ZelUtils::TextStream::Encoding kDocumentEncoding = ZelUtils::TextStream::UTF8;

// Grows `values` geometrically so that one more push_back cannot throw.
template <class T> void MakeRoomForOne(std::vector<T>& values) {
  if (values.size() == values.capacity())
    values.reserve(values.size() * 2 + 8);
}

} // namespace

namespace detail {

// The parent links of the styles an import touches, as a forest whose paths
// are kept in splay trees (a link-cut forest), so that whether a new link
// would close a cycle takes amortised logarithmic time, and constant time for
// the shapes real documents have, however long their chains. A style enters
// the forest, with its whole chain, the first time it is to be a parent; a
// child that is not in it cannot be an ancestor of anything and is linked at
// once. The forest stays exact as long as parent links change only through
// it while the import runs.
class ParentForest {
public:
  // Whether `child` may inherit from `parent` (false when `child` is `parent`
  // or one of its ancestors); when it may, the new link is recorded.
  bool Link(const Style* child, const Style* parent) {
    if (child != m_reading)
      m_substyleLinked = true;
    if (child == parent)
      return false;
    const std::uint32_t above = Load(parent);
    const std::uint32_t node = Find(child);
    if (node == kNone)
      return true;
    Cut(node);
    if (FindRoot(above) == node) {
      if (const Style* current = child->GetParent())
        Attach(node, Find(current));
      return false;
    }
    Attach(node, above);
    return true;
  }

  // The style whose members the import reads; any other child is inside a
  // style's tree, and only such links can lead back to the style holding them.
  void SetReading(const Style* style) noexcept { m_reading = style; }
  bool SubstyleLinked() const noexcept { return m_substyleLinked; }

private:
  static constexpr std::uint32_t kNone = ~std::uint32_t(0);
  struct Node {
    std::uint32_t child[2] = {kNone, kNone};
    std::uint32_t up = kNone; // parent in the splay tree, else the path's parent
  };
  struct Slot {
    const Style* style = nullptr;
    std::uint32_t node = kNone;
  };

  std::uint32_t Find(const Style* style) const {
    if (m_slots.empty())
      return kNone;
    for (std::size_t i = Hash(style);; i = (i + 1) & (m_slots.size() - 1)) {
      if (!m_slots[i].style)
        return kNone;
      if (m_slots[i].style == style)
        return m_slots[i].node;
    }
  }
  // Files `node` as the node of `style`, which has none yet.
  void Index(const Style* style, std::uint32_t node) {
    if ((m_nodes.size() + 1) * 2 > m_slots.size()) {
      std::vector<Slot> slots(std::max<std::size_t>(64, m_slots.size() * 2));
      slots.swap(m_slots);
      for (const Slot& slot : slots)
        if (slot.style)
          Place(slot);
    }
    Place(Slot{style, node});
  }
  void Place(const Slot& slot) {
    std::size_t i = Hash(slot.style);
    while (m_slots[i].style)
      i = (i + 1) & (m_slots.size() - 1);
    m_slots[i] = slot;
  }
  std::size_t Hash(const Style* style) const {
    return static_cast<std::size_t>((reinterpret_cast<std::uintptr_t>(style) >> 4) *
                                    0x9E3779B97F4A7C15ull) &
           (m_slots.size() - 1);
  }
  // The node of `style`, made with those of its ancestors when missing.
  std::uint32_t Load(const Style* style) {
    std::uint32_t above = Find(style);
    if (above != kNone)
      return above;
    m_chain.clear();
    for (const Style* ancestor = style; ancestor; ancestor = ancestor->GetParent()) {
      if ((above = Find(ancestor)) != kNone)
        break;
      m_chain.push_back(ancestor);
    }
    for (auto it = m_chain.rbegin(); it != m_chain.rend(); ++it) {
      const auto node = static_cast<std::uint32_t>(m_nodes.size());
      Index(*it, node);
      m_nodes.emplace_back();
      if (above != kNone)
        Attach(node, above);
      above = node;
    }
    return above;
  }
  bool IsSplayRoot(std::uint32_t x) const {
    const std::uint32_t up = m_nodes[x].up;
    return up == kNone || (m_nodes[up].child[0] != x && m_nodes[up].child[1] != x);
  }
  void Rotate(std::uint32_t x) {
    const std::uint32_t y = m_nodes[x].up;
    const std::uint32_t z = m_nodes[y].up;
    const int side = m_nodes[y].child[1] == x ? 1 : 0;
    if (!IsSplayRoot(y))
      m_nodes[z].child[m_nodes[z].child[1] == y ? 1 : 0] = x;
    m_nodes[x].up = z;
    const std::uint32_t moved = m_nodes[x].child[1 - side];
    m_nodes[y].child[side] = moved;
    if (moved != kNone)
      m_nodes[moved].up = y;
    m_nodes[x].child[1 - side] = y;
    m_nodes[y].up = x;
  }
  void Splay(std::uint32_t x) {
    while (!IsSplayRoot(x)) {
      const std::uint32_t y = m_nodes[x].up;
      if (!IsSplayRoot(y)) {
        const std::uint32_t z = m_nodes[y].up;
        const bool sameSide = (m_nodes[z].child[0] == y) == (m_nodes[y].child[0] == x);
        Rotate(sameSide ? y : x);
      }
      Rotate(x);
    }
  }
  // Makes the path from x's root down to x one splay tree, rooted at x.
  void Access(std::uint32_t x) {
    std::uint32_t below = kNone;
    for (std::uint32_t y = x; y != kNone; y = m_nodes[y].up) {
      Splay(y);
      m_nodes[y].child[1] = below;
      below = y;
    }
    Splay(x);
  }
  std::uint32_t FindRoot(std::uint32_t x) {
    Access(x);
    while (m_nodes[x].child[0] != kNone)
      x = m_nodes[x].child[0];
    Splay(x);
    return x;
  }
  // Links the root x below `parent`.
  void Attach(std::uint32_t x, std::uint32_t parent) {
    Access(x);
    m_nodes[x].up = parent;
  }
  // Cuts x from its parent, if it has one.
  void Cut(std::uint32_t x) {
    Access(x);
    const std::uint32_t above = m_nodes[x].child[0];
    if (above != kNone) {
      m_nodes[above].up = kNone;
      m_nodes[x].child[0] = kNone;
    }
  }

  std::vector<Node> m_nodes;
  // Each style's node, by open addressing on the style's address.
  std::vector<Slot> m_slots;
  std::vector<const Style*> m_chain; // scratch of Load
  const Style* m_reading = nullptr;
  bool m_substyleLinked = false;
};

// An open-addressing table of index entries keyed by what KeyOf reads from an
// entry: linear probing in a power-of-two array, deletion by shifting back,
// so a lookup touches one or two cache lines instead of a chain of nodes.
template <class Entry, class KeyOf> class EntryTable {
public:
  using Key = decltype(KeyOf()(std::declval<const Entry&>()));

  std::size_t Size() const noexcept { return m_count; }
  Entry* Find(const Key& key, std::size_t hash) const {
    if (m_slots.empty())
      return nullptr;
    for (std::size_t i = hash & Mask();; i = (i + 1) & Mask()) {
      const Slot& slot = m_slots[i];
      if (!slot.entry)
        return nullptr;
      if (slot.hash == hash && KeyOf()(*slot.entry) == key)
        return slot.entry;
    }
  }
  // Adds `entry`, whose key must not be in the table yet.
  void Insert(Entry* entry, std::size_t hash) {
    Reserve(m_count + 1);
    std::size_t i = hash & Mask();
    while (m_slots[i].entry)
      i = (i + 1) & Mask();
    m_slots[i] = Slot{hash, entry};
    ++m_count;
  }
  void Erase(const Entry* entry, std::size_t hash) {
    std::size_t i = hash & Mask();
    while (m_slots[i].entry != entry)
      i = (i + 1) & Mask();
    // Shift back the entries that probed past the freed slot.
    for (std::size_t j = (i + 1) & Mask(); m_slots[j].entry; j = (j + 1) & Mask()) {
      const std::size_t home = m_slots[j].hash & Mask();
      if (((j - home) & Mask()) >= ((j - i) & Mask())) {
        m_slots[i] = m_slots[j];
        i = j;
      }
    }
    m_slots[i] = Slot{};
    --m_count;
  }
  // Room for `count` entries at a load of at most three quarters.
  void Reserve(std::size_t count) {
    if (count * 4 <= m_slots.size() * 3)
      return;
    std::size_t capacity = 16;
    while (capacity * 3 < count * 4)
      capacity *= 2;
    std::vector<Slot> slots(capacity);
    slots.swap(m_slots);
    for (const Slot& slot : slots) {
      if (!slot.entry)
        continue;
      std::size_t i = slot.hash & Mask();
      while (m_slots[i].entry)
        i = (i + 1) & Mask();
      m_slots[i] = slot;
    }
  }
  void Clear() noexcept {
    m_slots.clear();
    m_count = 0;
  }

private:
  struct Slot {
    std::size_t hash = 0;
    Entry* entry = nullptr;
  };
  std::size_t Mask() const noexcept { return m_slots.size() - 1; }

  std::vector<Slot> m_slots;
  std::size_t m_count = 0;
};

// Sorts a range whose ascending runs are already long, as the names of a
// document usually are (each category lists its styles in name order), by
// merging the runs; a range of many runs is sorted afresh.
template <class Iterator, class Less> void SortRuns(Iterator first, Iterator last, Less less) {
  constexpr std::size_t kMostRuns = 64;
  std::vector<Iterator> bounds{first};
  for (Iterator it = first; it != last && bounds.size() <= kMostRuns; ++it)
    if (it + 1 != last && less(*(it + 1), *it))
      bounds.push_back(it + 1);
  if (bounds.size() > kMostRuns) {
    std::sort(first, last, less);
    return;
  }
  bounds.push_back(last);
  while (bounds.size() > 2) {
    std::vector<Iterator> merged{first};
    for (std::size_t i = 0; i + 2 < bounds.size(); i += 2) {
      std::inplace_merge(bounds[i], bounds[i + 1], bounds[i + 2], less);
      merged.push_back(bounds[i + 2]);
    }
    if (bounds.size() % 2 == 0)
      merged.push_back(last);
    bounds.swap(merged);
  }
}

// The sheet's styles by name and by pointer. A name is case-folded once, when
// it is filed, and looked up by a hash of its folding, so finding a style
// costs one folding of the asked name whatever the sheet's size. Name order
// is a sorted list that new names join when the order is next asked for.
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
  Entry* Add(std::u16string_view name, Style* style) {
    thread_local std::u16string folded;
    ZelPlatform::detail::FoldCaseUtf16(name, folded);
    return Add(name, folded, style);
  }
  // The same for a name whose folding is known.
  Entry* Add(std::u16string_view name, std::u16string_view folded, Style* style) {
    std::unique_ptr<char16_t[]> text = Spell(name, folded);
    MakeRoomForOne(m_ordered);
    MakeRoomForOne(m_pending);
    m_byName.Reserve(m_byName.Size() + 1);
    m_byStyle.Reserve(m_byStyle.Size() + 1);
    if (m_free.empty())
      m_entries.emplace_back();
    // Nothing below throws.
    Entry* entry = &m_entries.back();
    if (!m_free.empty()) {
      entry = m_free.back();
      m_free.pop_back();
    }
    *entry = Entry();
    entry->style = style;
    entry->text = std::move(text);
    entry->nameLength = static_cast<std::uint32_t>(name.size());
    entry->foldedStart = folded == name ? 0 : entry->nameLength;
    entry->foldedLength = static_cast<std::uint32_t>(folded.size());
    m_byName.Insert(entry, HashName(entry->Folded()));
    if (style)
      m_byStyle.Insert(entry, HashStyle(style));
    m_pending.push_back(entry);
    return entry;
  }
  // Files `style` in place of the entry's style, under `spelling`, which
  // folds as the entry's name does.
  void Replace(Entry* entry, std::u16string_view spelling, Style* style) {
    // The new block holds the folding apart exactly when it differs.
    const bool foldedApart = entry->Folded() != spelling;
    std::unique_ptr<char16_t[]> text = Spell(spelling, entry->Folded());
    m_byStyle.Reserve(m_byStyle.Size() + 1);
    if (entry->style != style) {
      if (entry->style)
        m_byStyle.Erase(entry, HashStyle(entry->style));
      if (style)
        m_byStyle.Insert(entry, HashStyle(style));
    }
    entry->style = style;
    entry->text = std::move(text);
    entry->nameLength = static_cast<std::uint32_t>(spelling.size());
    entry->foldedStart = foldedApart ? entry->nameLength : 0;
  }
  // Takes the entry out of both indexes; its slot is reused later.
  void Erase(Entry* entry) {
    if (entry->listed)
      m_byName.Erase(entry, HashName(entry->Folded()));
    if (entry->style)
      m_byStyle.Erase(entry, HashStyle(entry->style));
    entry->listed = false;
    entry->erased = true;
    // Erased entries are recycled after the next ordering drops them, or once
    // they outnumber the live ones.
    if (++m_erased > m_byStyle.Size() + 16)
      Ordered();
  }
  // Drops every name; the styles stay known by pointer.
  void DropNames() {
    for (Entry& entry : m_entries)
      entry.listed = false;
    m_byName.Clear();
    m_stale = true;
  }
  // The listed entries in name order.
  const std::vector<Entry*>& Ordered() const {
    if (m_pending.empty() && !m_stale && m_erased == 0)
      return m_ordered;
    const auto unlisted = [](const Entry* entry) { return !entry->listed; };
    const auto less = [](const Entry* a, const Entry* b) {
      return ZelPlatform::detail::CompareCodePointOrder(a->Folded(), b->Folded()) < 0;
    };
    m_ordered.erase(std::remove_if(m_ordered.begin(), m_ordered.end(), unlisted), m_ordered.end());
    m_pending.erase(std::remove_if(m_pending.begin(), m_pending.end(), unlisted), m_pending.end());
    const std::size_t middle = m_ordered.size();
    m_ordered.insert(m_ordered.end(), m_pending.begin(), m_pending.end());
    SortRuns(m_ordered.begin() + static_cast<std::ptrdiff_t>(middle), m_ordered.end(), less);
    std::inplace_merge(m_ordered.begin(), m_ordered.begin() + static_cast<std::ptrdiff_t>(middle),
                       m_ordered.end(), less);
    m_pending.clear();
    m_stale = false;
    if (m_erased) {
      for (Entry& entry : m_entries) {
        if (entry.erased && entry.text) {
          entry.text.reset();
          m_free.push_back(&entry);
        }
      }
      m_erased = 0;
    }
    return m_ordered;
  }
  // Every style, listed ones in name order first, then those known only by
  // pointer; the index is left empty.
  std::vector<Style*> TakeStyles() {
    std::vector<Style*> styles;
    styles.reserve(m_entries.size());
    for (const Entry* entry : Ordered())
      styles.push_back(entry->style);
    for (const Entry& entry : m_entries)
      if (!entry.listed && !entry.erased && entry.style)
        styles.push_back(entry.style);
    m_byName.Clear();
    m_byStyle.Clear();
    m_ordered.clear();
    m_free.clear();
    m_entries.clear();
    return styles;
  }

private:
  struct FoldedOf {
    std::u16string_view operator()(const Entry& entry) const { return entry.Folded(); }
  };
  // One block holding `name`, then `folded` unless it equals the name.
  static std::unique_ptr<char16_t[]> Spell(std::u16string_view name, std::u16string_view folded) {
    const std::size_t length = name.size() + (folded == name ? 0 : folded.size());
    std::unique_ptr<char16_t[]> text(new char16_t[length ? length : 1]);
    std::copy(name.begin(), name.end(), text.get());
    if (folded != name)
      std::copy(folded.begin(), folded.end(), text.get() + name.size());
    return text;
  }
  struct StyleOf {
    const Style* operator()(const Entry& entry) const { return entry.style; }
  };
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
  EntryTable<Entry, FoldedOf> m_byName;
  EntryTable<Entry, StyleOf> m_byStyle;
};

} // namespace detail

namespace {

// Files `style` under `name` with one search of the index. `previous`
// receives the style replaced (detached, not destroyed). Returns the entry
// filed under `name` and whether `style` went in; when it did not (a clash
// without `replace`), `style` is still the caller's to destroy.
std::pair<detail::StyleIndex::Entry*, bool> FileStyle(detail::StyleIndex& index,
                                                      std::u16string_view name, Style* style,
                                                      bool replace, Style*& previous) {
  previous = nullptr;
  thread_local std::u16string folded;
  ZelPlatform::detail::FoldCaseUtf16(name, folded);
  detail::StyleIndex::Entry* found = index.FindFolded(folded);
  if (found && !replace)
    return {found, false};
  try {
    if (!found)
      return {index.Add(name, folded, style), true};
    // Replacing re-files the name under the caller's spelling.
    previous = found->style;
    index.Replace(found, name, style);
    return {found, true};
  } catch (...) {
    // The sheet owns the offered style even when it could not be filed.
    previous = nullptr;
    delete style;
    throw;
  }
}

} // namespace

IStyleSheetDuplicationContext::~IStyleSheetDuplicationContext() = default;

StyleSheet::StyleSheet()
    : m_index(new detail::StyleIndex), m_version(GetStyleManager().GetCurrentVersion()) {}

StyleSheet::~StyleSheet() { Clear(); }

ZelStringT<char16_t> StyleSheet::GetExternalID() const { return m_externalID; }

void StyleSheet::SetExternalID(const ZelStringT<char16_t>& id) { m_externalID = id; }

void StyleSheet::Clear() {
  m_version = GetStyleManager().GetCurrentVersion();
  // Styles known only by pointer (MergeIn dropped their names) come last;
  // they are the sheet's too.
  for (Style* style : m_index->TakeStyles())
    delete style;
}

Style* StyleSheet::AddStyle(const ZelStringT<char16_t>& name, Style* style, bool replace) {
  if (style) {
    if (detail::StyleIndex::Entry* filedAs = m_index->Find(style)) {
      if (m_index->Find(name.GetView()) == filedAs) {
        // Already filed under this name: destroying or handing it back would
        // leave the sheet listing a style it no longer has.
        if (replace)
          m_index->Replace(filedAs, name.GetView(), style);
        return nullptr;
      }
      // Filed under another name: it leaves that one, so that the sheet never
      // lists one style twice.
      m_index->Erase(filedAs);
    }
  }
  Style* previous = nullptr;
  const auto [entry, filed] = FileStyle(*m_index, name.GetView(), style, replace, previous);
  if (!filed) {
    // The style already in the sheet wins; whatever referred to the offered
    // one follows the name.
    if (style) {
      Redirect({{style, entry->style}});
      delete style;
    }
    return nullptr;
  }
  if (previous)
    Redirect({{previous, style}});
  return previous;
}

void StyleSheet::Redirect(const std::map<Style*, Style*>& heirs) {
  if (heirs.empty())
    return;
  // Styles that an heir is or inherits from cannot take it as parent without
  // a cycle, and nothing can take a null heir: those take over the old
  // style's values instead, as DeleteStyles would do.
  std::vector<Style*> olds, heirLines;
  for (const auto& [old, heir] : heirs) {
    olds.push_back(old);
    for (Style* style = heir; style; style = style->GetParent())
      heirLines.push_back(style);
  }
  std::sort(heirLines.begin(), heirLines.end());
  const StyleSpan doomed(olds, true);
  const bool anyNull = std::any_of(heirs.begin(), heirs.end(),
                                   [](const auto& pair) { return pair.second == nullptr; });
  for (Style* style : GetStyles()) {
    if (!style)
      continue;
    if (anyNull || std::binary_search(heirLines.begin(), heirLines.end(), style))
      style->RemoveDependency(doomed, true);
    else
      style->RemapDependency(heirs);
  }
}

bool StyleSheet::AcceptParent(Style& child, Style& parent) const {
  if (m_import)
    return m_import->Link(&child, &parent);
  return !child.IsAncestorOrSelf(&parent);
}

Style* StyleSheet::RemoveStyle(const ZelStringT<char16_t>& name) {
  detail::StyleIndex::Entry* entry = m_index->Find(name.GetView());
  if (!entry)
    return nullptr;
  Style* style = entry->style;
  m_index->Erase(entry);
  return style;
}

bool StyleSheet::RemoveStyle(Style* style) {
  detail::StyleIndex::Entry* entry = style ? m_index->Find(style) : nullptr;
  if (!entry)
    return false;
  m_index->Erase(entry);
  return true;
}

void StyleSheet::DeleteStyles(StyleSpan styles) {
  // Every style drops its references first, the doomed ones included, so
  // that no surviving style is left pointing at a destroyed one.
  std::vector<Style*> storage;
  const StyleSpan doomed = ZelUtils::MakeSearchable(styles, storage);
  for (Style* style : GetStyles())
    if (style)
      style->RemoveDependency(doomed, true);
  for (Style* style : styles) {
    detail::StyleIndex::Entry* entry = style ? m_index->Find(style) : nullptr;
    if (!entry)
      continue; // foreign styles are left to their owner
    m_index->Erase(entry);
    delete style;
  }
}

void StyleSheet::RenameStyle(const ZelStringT<char16_t>& oldName,
                             const ZelStringT<char16_t>& newName) {
  detail::StyleIndex::Entry* entry = m_index->Find(oldName.GetView());
  if (!entry)
    return;
  detail::StyleIndex::Entry* taken = m_index->Find(newName.GetView());
  if (taken == entry) {
    // Only the letter case changes: the name is re-spelled in place.
    m_index->Replace(entry, newName.GetView(), entry->style);
  } else if (!taken) {
    Style* style = entry->style;
    m_index->Erase(entry);
    m_index->Add(newName.GetView(), style);
  }
}

void StyleSheet::MergeIn(StyleSheet& other, bool replace) {
  // Walks this sheet's own index, not `other`'s: a long-standing behaviour
  // hosts rely on, kept as it is. Each style goes back into this sheet and
  // whatever AddStyle hands back is destroyed. A snapshot keeps the walk
  // valid while AddStyle changes the index.
  std::vector<std::pair<ZelStringT<char16_t>, Style*>> own;
  own.reserve(m_index->Size());
  for (const detail::StyleIndex::Entry* entry : m_index->Ordered())
    own.emplace_back(ZelStringT<char16_t>(entry->Name()), entry->style);
  for (const auto& entry : own)
    delete AddStyle(entry.first, entry.second, replace);
  other.m_index->DropNames();
}

Style* StyleSheet::GetStyle(const ZelStringT<char16_t>& name) const {
  return FindStyle(name.GetView());
}

Style* StyleSheet::FindStyle(std::u16string_view name) const {
  const detail::StyleIndex::Entry* entry = m_index->Find(name);
  return entry ? entry->style : nullptr;
}

std::vector<Style*> StyleSheet::GetStyles() const {
  const std::vector<detail::StyleIndex::Entry*>& ordered = m_index->Ordered();
  std::vector<Style*> styles;
  styles.reserve(ordered.size());
  for (const detail::StyleIndex::Entry* entry : ordered)
    styles.push_back(entry->style);
  return styles;
}

std::vector<Style*>
StyleSheet::GetStylesByName(const std::vector<ZelStringT<char16_t>>& names) const {
  std::vector<Style*> styles;
  styles.reserve(names.size());
  for (const ZelStringT<char16_t>& name : names)
    if (Style* style = GetStyle(name))
      styles.push_back(style);
  return styles;
}

std::vector<Style*> StyleSheet::GetStylesByCategory(const PropertyKey& category) const {
  std::vector<Style*> styles;
  for (const detail::StyleIndex::Entry* entry : m_index->Ordered())
    if (entry->style && entry->style->GetCategoryName() == category)
      styles.push_back(entry->style);
  return styles;
}

ZelStringT<char16_t> StyleSheet::GetStyleName(const Style* style) const {
  return ZelStringT<char16_t>(FindStyleName(style));
}

std::u16string_view StyleSheet::FindStyleName(const Style* style) const {
  const detail::StyleIndex::Entry* entry = style ? m_index->Find(style) : nullptr;
  return entry ? entry->Name() : std::u16string_view();
}

std::vector<ZelStringT<char16_t>> StyleSheet::GetStyleNames() const {
  const std::vector<detail::StyleIndex::Entry*>& ordered = m_index->Ordered();
  std::vector<ZelStringT<char16_t>> names;
  names.reserve(ordered.size());
  for (const detail::StyleIndex::Entry* entry : ordered)
    names.emplace_back(entry->Name());
  return names;
}

std::vector<ZelStringT<char16_t>> StyleSheet::GetStyleNames(const PropertyKey& category) const {
  std::vector<ZelStringT<char16_t>> names;
  for (const detail::StyleIndex::Entry* entry : m_index->Ordered())
    if (entry->style && entry->style->GetCategoryName() == category)
      names.emplace_back(entry->Name());
  return names;
}

StyleSheet::NameIndex StyleSheet::GetChildStyles(const Style* parent) const {
  NameIndex children;
  if (!parent)
    return children;
  for (const detail::StyleIndex::Entry* entry : m_index->Ordered())
    if (entry->style && entry->style->GetParent() == parent)
      children.emplace_hint(children.end(), ZelStringT<char16_t>(entry->Name()), entry->style);
  return children;
}

void StyleSheet::GenerateCategoryStyleMap(CategoryStyleMap& out) const {
  out.clear();
  for (const detail::StyleIndex::Entry* entry : m_index->Ordered()) {
    if (!entry->style)
      continue;
    NameIndex& styles = out[entry->style->GetCategoryName()];
    styles.emplace_hint(styles.end(), ZelStringT<char16_t>(entry->Name()), entry->style);
  }
}

void StyleSheet::GetDependencies(StyleSpan styles, std::vector<Style*>& out) const {
  Style::AppendDependents(GetStyles(), styles, out);
}

Style* StyleSheet::GetExternalStyleAlias(const ZelStringT<char16_t>& externalID,
                                         const ZelStringT<char16_t>& externalName) const {
  if (externalID.IsEmpty() || externalName.IsEmpty())
    return nullptr;
  for (const detail::StyleIndex::Entry* entry : m_index->Ordered()) {
    const Style* style = entry->style;
    if (style && style->GetExternalID().Compare(externalID, 0) == 0 &&
        style->GetExternalName().Compare(externalName, 0) == 0)
      return entry->style;
  }
  return nullptr;
}

ZelStringT<char16_t> StyleSheet::GetUnusedStyleName(const ZelStringT<char16_t>& proposed) const {
  ZelStringT<char16_t> candidate = proposed;
  StyleManager& manager = GetStyleManager();
  if (manager.CategoryExists(proposed)) {
    // A category's key is not a good style name; start from its UI name.
    const PropertyKey key(proposed);
    candidate = manager.GetCategory(key)->GetUIName() + u" 1";
  }
  return ZelUtils::String::FindUnusedName(candidate, [this](const ZelStringT<char16_t>& name) {
    return m_index->Find(name.GetView()) != nullptr;
  });
}

void StyleSheet::CopyContentsFrom(const StyleSheet& source,
                                  IStyleSheetDuplicationContext* context) {
  Clear();
  ZelStringT<char16_t> text;
  source.ExportToString(text, true);
  ImportFromString(text, true);
  if (context)
    for (Style* style : GetStyles())
      context->OnStyleDuplicated(style, 0);
  m_version = source.m_version;
}

namespace {

// The filed styles by category (in key order), each list in name order.
std::map<PropertyKey, std::vector<const detail::StyleIndex::Entry*>>
GroupByCategory(const detail::StyleIndex& index) {
  std::map<PropertyKey, std::vector<const detail::StyleIndex::Entry*>> categories;
  for (const detail::StyleIndex::Entry* entry : index.Ordered())
    if (entry->style)
      categories[entry->style->GetCategoryName()].push_back(entry);
  return categories;
}

} // namespace

void StyleSheet::ExportJson(JsonValue& out, bool includeTemporary) const {
  Json::Object& document = out.Get<Json::Object>();
  const auto categories = GroupByCategory(*m_index);
  if (m_version > 0)
    document.AddValue(k_strVersion, Json::Value(m_version));
  if (!m_externalID.IsEmpty())
    document.AddValue(k_strExternalID, Json::Value(m_externalID));
  for (const auto& [category, entries] : categories) {
    Json::Object styles;
    styles.Reserve(entries.size());
    for (const detail::StyleIndex::Entry* entry : entries) {
      Json::Value json;
      entry->style->Serialize(*this, json, includeTemporary);
      styles.AddValue(ZelStringT<char16_t>(entry->Name()), std::move(json));
    }
    document.AddValue(category.GetString(), Json::Value(std::move(styles)));
  }
}

namespace {

// Points the sheet's import bookkeeping at a forest for as long as it lives.
class ImportScope {
public:
  explicit ImportScope(detail::ParentForest*& slot) : m_slot(slot), m_previous(slot) {
    slot = &m_forest;
  }
  ~ImportScope() { m_slot = m_previous; }
  ImportScope(const ImportScope&) = delete;
  ImportScope& operator=(const ImportScope&) = delete;

private:
  detail::ParentForest m_forest;
  detail::ParentForest*& m_slot;
  detail::ParentForest* m_previous;
};

} // namespace

bool StyleSheet::ImportJson(Json::Object* document, bool replace) {
  assert(document && "ImportJson needs a document");
  if (!document)
    return false;
  ImportMembers<detail::TreeAccess>(*document, replace);
  return true;
}

template <class Access>
void StyleSheet::ImportMembers(const typename Access::Object& document, bool replace) {
  StyleManager& manager = GetStyleManager();
  // Entries that hold a style made by this import carry its stamp; only
  // those styles are read, so styles that were in the sheet before are never
  // read into.
  const std::uint32_t stamp = m_index->NextImportStamp();
  // The index entry filed under each style member's name, in document order.
  // Import never erases an entry (a replacement re-files it), so the second
  // pass reads each entry instead of searching for the name again.
  std::vector<detail::StyleIndex::Entry*> filed;
  // Styles that replacements took out of the sheet, with the entry of the
  // name each held. They are destroyed after the first pass, once every style
  // that referred to one refers to the style holding its name at that time.
  std::vector<std::pair<Style*, const detail::StyleIndex::Entry*>> replaced;
  const auto repairReplaced = [this, &replaced] {
    std::map<Style*, Style*> heirs;
    for (const auto& [old, entry] : replaced)
      heirs[old] = entry->style;
    Redirect(heirs);
    for (const auto& old : replaced)
      delete old.first;
    replaced.clear();
  };
  bool versionSeen = false;
  bool anyReplaced = false;

  // The members are gone through twice. The first pass makes an empty style
  // for every name, so that every reference resolves when the second pass
  // reads the styles; the version and the ID are applied in both.
  const std::size_t memberCount = Access::Size(document);
  const auto applySheetMember = [&](std::u16string_view name, typename Access::Value value) {
    if (const std::optional<double> number = Access::AsNumber(value)) {
      if (name == k_strVersion) {
        m_version = detail::TruncateVersion(*number);
        versionSeen = true;
      }
    } else if (const std::optional<std::u16string_view> text = Access::AsString(value)) {
      // The document's ID is taken only by a sheet that already has one.
      if (name == k_strExternalID && !m_externalID.IsEmpty())
        m_externalID = ZelStringT<char16_t>(*text);
    }
  };

  // Goes through the members in document order: the sheet's own members
  // are applied, and `styles` gets each registered category's object.
  const auto forEachMember = [&](auto&& styles) {
    for (std::size_t i = 0; i < memberCount; ++i) {
      const std::u16string_view name = Access::Name(document, i);
      const typename Access::Value value = Access::Member(document, i);
      const auto category = Access::AsObject(value);
      if (!category) {
        applySheetMember(name, value);
        continue;
      }
      const std::optional<PropertyKey> categoryKey = PropertyKey::Find(name);
      if (categoryKey && manager.FindCategory(*categoryKey))
        styles(*categoryKey, *category);
    }
  };

  try {
    std::size_t styleCount = m_index->Size();
    for (std::size_t i = 0; i < memberCount; ++i)
      if (const auto category = Access::AsObject(Access::Member(document, i)))
        styleCount += Access::Size(*category);
    m_index->Reserve(styleCount);
    forEachMember([&](const PropertyKey&, const typename Access::Object& category) {
      for (std::size_t j = 0; j < Access::Size(category); ++j) {
        Access::RequireObject(Access::Member(category, j)); // std::bad_cast for a non-object
        // Room first, so that nothing below can throw once a style is out.
        MakeRoomForOne(filed);
        MakeRoomForOne(replaced);
        Style* style = new Style;
        Style* previous = nullptr;
        // FileStyle owns `style`, also when it throws.
        const auto [entry, isFiled] =
            FileStyle(*m_index, Access::Name(category, j), style, replace, previous);
        if (isFiled)
          entry->importStamp = stamp;
        else
          delete style;
        if (previous) {
          replaced.emplace_back(previous, entry);
          anyReplaced = true;
        }
        filed.push_back(entry);
      }
    });
  } catch (...) {
    repairReplaced();
    throw;
  }
  repairReplaced();

  const ImportScope scope(m_import);
  // The styles read, and after a replacement every style (a redirected
  // substyle may now inherit from a style read), are checked for substyles
  // that inherit their way back to the style holding them: once every link
  // is known, also when a behaviour throws.
  const auto dropContainedParents = [&] {
    if (!anyReplaced && !m_import->SubstyleLinked())
      return;
    std::vector<Style*> roots;
    if (anyReplaced) {
      roots = GetStyles();
    } else {
      for (const detail::StyleIndex::Entry* entry : filed)
        if (entry->importStamp == stamp)
          roots.push_back(entry->style);
    }
    DropSubstyleCycles(roots);
  };
  try {
    JsonValue scratch;
    std::size_t next = 0;
    forEachMember([&](const PropertyKey& categoryKey, const typename Access::Object& category) {
      for (std::size_t j = 0; j < Access::Size(category); ++j) {
        const detail::StyleIndex::Entry* entry = filed[next++];
        if (entry->importStamp != stamp)
          continue;
        Style* style = entry->style;
        m_import->SetReading(style);
        style->SetCategory(categoryKey);
        style->ReadMembers<Access>(*this, Access::RequireObject(Access::Member(category, j)),
                                   scratch);
        if (!m_externalID.IsEmpty())
          style->SetExternalID(m_externalID);
      }
    });
  } catch (...) {
    dropContainedParents();
    throw;
  }
  dropContainedParents();

  if (!versionSeen)
    m_version = 0;
}

void StyleSheet::DropSubstyleCycles(const std::vector<Style*>& roots) {
  // A graph of styles: each points to its parent and to the parent of every
  // substyle in its tree. Tarjan's algorithm, without recursion, finds the
  // groups of styles that reach one another; parent links alone never close
  // a circle, so dropping the substyle links inside each group leaves none.
  struct Node {
    std::vector<Style*> linked; // substyles in the tree that have a parent
    std::size_t index = 0;      // order of discovery, from 1
    std::size_t low = 0;        // lowest index reached; the group's index once done
    std::size_t next = 0;       // the next link to follow: the parent, then linked
    bool onStack = false;
  };
  std::unordered_map<const Style*, Node> nodes;
  std::vector<const Style*> stack, path;
  std::size_t discovered = 0;
  const auto enter = [&](const Style* style) {
    Node& node = nodes[style];
    node.index = node.low = ++discovered;
    node.onStack = true;
    stack.push_back(style);
    path.push_back(style);
    std::vector<const Style*> pending{style};
    while (!pending.empty()) {
      const Style* holder = pending.back();
      pending.pop_back();
      for (const PropertyMap::Entry& entry : holder->GetProperties())
        if (const BaseStyleProperty* behaviour = holder->FindBehaviour(entry.first))
          behaviour->ProcessStylesInProperty(entry.second, [&](Style* substyle) {
            if (substyle) {
              if (substyle->m_parent)
                node.linked.push_back(substyle);
              pending.push_back(substyle);
            }
            return true;
          });
    }
  };
  for (const Style* root : roots) {
    if (!root || nodes.count(root))
      continue;
    enter(root);
    while (!path.empty()) {
      const Style* style = path.back();
      Node& node = nodes[style]; // references survive rehashing
      if (node.next <= node.linked.size()) {
        const Style* to = node.next == 0 ? style->m_parent : node.linked[node.next - 1]->m_parent;
        ++node.next;
        if (!to)
          continue;
        const auto found = nodes.find(to);
        if (found == nodes.end())
          enter(to);
        else if (found->second.onStack)
          node.low = std::min(node.low, found->second.index);
        continue;
      }
      path.pop_back();
      if (!path.empty()) {
        Node& above = nodes[path.back()];
        above.low = std::min(above.low, node.low);
      }
      if (node.low == node.index) {
        const Style* member = nullptr;
        do {
          member = stack.back();
          stack.pop_back();
          Node& grouped = nodes[member];
          grouped.onStack = false;
          grouped.low = node.index;
        } while (member != style);
      }
    }
  }
  for (const auto& [style, node] : nodes)
    for (Style* substyle : node.linked) {
      const auto found = nodes.find(substyle->m_parent);
      if (found != nodes.end() && found->second.low == node.low)
        substyle->m_parent = nullptr;
    }
}

bool StyleSheet::ImportFromString(const ZelStringT<char16_t>& text, bool replace) {
  if (typeid(*this) != typeid(StyleSheet)) {
    // A derived sheet may read documents its own way: go through ImportJson.
    Json::Value value;
    ZelStringT<char16_t> errorText;
    try {
      if (!Json::Parse(text, value, errorText))
        return false;
    } catch (...) {
      return false;
    }
    Json::Object* document = value.GetIf<Json::Object>();
    return document && ImportJson(document, replace);
  }
  // The same import as ImportJson's, read from a compact parse of the text.
  Json::Document document;
  ZelStringT<char16_t> errorText;
  try {
    if (!document.Parse(text, errorText))
      return false;
  } catch (...) {
    return false;
  }
  const Json::Document::Ref root = document.GetRoot();
  if (!root.IsObject())
    return false;
  ImportMembers<detail::DocumentAccess>(root, replace);
  return true;
}

void StyleSheet::ExportToString(ZelStringT<char16_t>& text, bool includeTemporary) const {
  if (typeid(*this) != typeid(StyleSheet)) {
    // A derived sheet may write its own document: go through ExportJson.
    JsonValue value{Json::Object()};
    ExportJson(value, includeTemporary);
    text = Json::ValueToString(value, false);
    return;
  }
  // The same text as ExportJson's tree would give, written without the tree.
  const auto categories = GroupByCategory(*m_index);
  // A generous guess of the text's length saves the text's growth steps.
  std::size_t estimate = 64;
  for (const auto& group : categories)
    for (const detail::StyleIndex::Entry* entry : group.second)
      estimate += entry->nameLength + 32 + 48 * entry->style->GetProperties().size();
  Json::Writer writer(false);
  writer.Reserve(estimate);
  writer.StartObject();
  if (m_version > 0) {
    writer.Key(k_strVersion);
    writer.Write(Json::Value(m_version));
  }
  if (!m_externalID.IsEmpty()) {
    writer.Key(k_strExternalID);
    writer.String(m_externalID.GetView());
  }
  JsonValue scratch;
  for (const auto& [category, entries] : categories) {
    writer.Key(category.GetView());
    writer.StartObject();
    for (const detail::StyleIndex::Entry* entry : entries) {
      writer.Key(entry->Name());
      entry->style->WriteJson(*this, writer, includeTemporary, scratch);
    }
    writer.EndObject();
  }
  writer.EndObject();
  text = writer.TakeText();
}

bool StyleSheet::Export(ZelUtils::Stream& stream) const {
  ZelStringT<char16_t> text;
  ExportToString(text, false);
  ZelUtils::TextStreamWriter writer(stream, kDocumentEncoding, false);
  return writer.Write(text);
}

bool StyleSheet::Import(ZelUtils::Stream& stream, bool replace) {
  ZelUtils::TextStreamReader reader(stream, kDocumentEncoding);
  const ZelStringT<char16_t> text = reader.ReadToEnd();
  return ImportFromString(text, replace);
}

} // namespace Styles
