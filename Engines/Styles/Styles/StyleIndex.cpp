// The name index's filing, re-spelling, erasing and name ordering; the
// sheet owns one, and the document reader and writer walk it.
#include <Styles/Internal/StyleIndex.h>

#include <Styles/Internal/SortRuns.h>
#include <Styles/Style.h>

#include <algorithm>
#include <cassert>
#include <iterator>
#include <limits>

namespace Styles {
namespace detail {

StyleIndex::Entry* StyleIndex::Add(std::u16string_view name, Style* style) {
  thread_local std::u16string folded;
  ZelPlatform::detail::FoldCaseUtf16(name, folded);
  return Add(name, folded, style);
}

StyleIndex::Entry* StyleIndex::Add(std::u16string_view name, std::u16string_view folded,
                                   Style* style) {
  std::unique_ptr<char16_t[]> text = Spell(name, folded);
  MakeRoomForOne(m_ordered);
  MakeRoomForOne(m_pending);
  m_byName.Reserve(m_byName.Size() + 1);
  m_byStyle.Reserve(m_byStyle.Size() + 1);
  if (m_free.empty()) {
    // A slot holds the position in 32 bits, far beyond what memory allows.
    assert(m_entries.size() < std::numeric_limits<std::uint32_t>::max());
    m_entries.emplace_back();
    m_entries.back().position = static_cast<std::uint32_t>(m_entries.size() - 1);
  }
  // Nothing below throws.
  Entry* entry = &m_entries.back();
  if (!m_free.empty()) {
    entry = m_free.back();
    m_free.pop_back();
  }
  const std::uint32_t position = entry->position;
  *entry = Entry();
  entry->position = position;
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

void StyleIndex::Replace(Entry* entry, std::u16string_view spelling, Style* style) {
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

void StyleIndex::Erase(Entry* entry) {
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

void StyleIndex::DropNames() {
  for (Entry& entry : m_entries)
    entry.listed = false;
  m_byName.Clear();
  m_stale = true;
}

const std::vector<StyleIndex::Entry*>& StyleIndex::Ordered() const {
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

std::vector<Style*> StyleIndex::TakeStyles() {
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

std::unique_ptr<char16_t[]> StyleIndex::Spell(std::u16string_view name,
                                              std::u16string_view folded) {
  const std::size_t length = name.size() + (folded == name ? 0 : folded.size());
  std::unique_ptr<char16_t[]> text(new char16_t[length ? length : 1]);
  std::copy(name.begin(), name.end(), text.get());
  if (folded != name)
    std::copy(folded.begin(), folded.end(), text.get() + name.size());
  return text;
}

std::pair<StyleIndex::Entry*, bool> StyleIndex::File(std::u16string_view name, Style* style,
                                                     bool replace, Style*& previous) {
  previous = nullptr;
  thread_local std::u16string folded;
  ZelPlatform::detail::FoldCaseUtf16(name, folded);
  Entry* found = FindFolded(folded);
  if (found && !replace)
    return {found, false};
  try {
    if (!found)
      return {Add(name, folded, style), true};
    // Replacing re-files the name under the caller's spelling.
    previous = found->style;
    Replace(found, name, style);
    return {found, true};
  } catch (...) {
    // The sheet owns the offered style even when it could not be filed.
    previous = nullptr;
    delete style;
    throw;
  }
}

} // namespace detail
} // namespace Styles
