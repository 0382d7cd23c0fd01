// The sheet: filing, renaming, removing and deleting styles with the repair
// of references, and the queries over its name index. Reading and writing
// its document live in DocumentReader.cpp and DocumentWriter.cpp.
#include <Styles/StyleSheet.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>

#include <Styles/Internal/ParentForest.h>
#include <Styles/Internal/StyleDependencies.h>
#include <Styles/Internal/StyleIndex.h>

#include <algorithm>
#include <map>
#include <utility>
#include <vector>

namespace Styles {

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
  const auto [entry, filed] = m_index->File(name.GetView(), style, replace, previous);
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
  for (const Style* ancestor = &parent; ancestor; ancestor = ancestor->GetParent())
    if (ancestor == &child)
      return false;
  return true;
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
  detail::AppendDependents(GetStyles(), styles, out);
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

} // namespace Styles
