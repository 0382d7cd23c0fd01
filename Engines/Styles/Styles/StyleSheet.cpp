#include <Styles/StyleSheet.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>

#include <Json/Json.h>
#include <ZelUtils/TextStream.h>

#include <algorithm>
#include <cassert>
#include <climits>
#include <cmath>
#include <iterator>
#include <memory>
#include <utility>

namespace Styles {

namespace {

// Member names of the document object.
constexpr char16_t k_strVersion[] = u"version";
constexpr char16_t k_strExternalID[] = u"id";

// The byte encoding of documents in streams, the same both ways.
constexpr ZelUtils::TextStream::Encoding kDocumentEncoding = ZelUtils::TextStream::UTF8;

bool NameEquals(const ZelStringT<char16_t>& name, const char16_t* fixed) {
  return name.Compare(fixed, 0) == 0;
}

// A document number truncated toward zero into an int; values beyond the
// range of int are clamped so that no input makes the conversion undefined.
int TruncateVersion(double number) {
  if (std::isnan(number))
    return 0;
  const double truncated = std::trunc(number);
  if (truncated <= static_cast<double>(INT_MIN))
    return INT_MIN;
  if (truncated >= static_cast<double>(INT_MAX))
    return INT_MAX;
  return static_cast<int>(truncated);
}

} // namespace

IStyleSheetDuplicationContext::~IStyleSheetDuplicationContext() = default;

StyleSheet::StyleSheet()
    : m_styles(new NameIndex), m_names(new PointerIndex),
      m_version(GetStyleManager().GetCurrentVersion()) {}

StyleSheet::~StyleSheet() { Clear(); }

ZelStringT<char16_t> StyleSheet::GetExternalID() const { return m_externalID; }

void StyleSheet::SetExternalID(const ZelStringT<char16_t>& id) { m_externalID = id; }

void StyleSheet::Clear() {
  m_version = GetStyleManager().GetCurrentVersion();
  NameIndex styles;
  styles.swap(*m_styles);
  m_names->clear();
  for (auto& entry : styles)
    delete entry.second;
}

Style* StyleSheet::AddStyle(const ZelStringT<char16_t>& name, Style* style, bool replace) {
  Style* previous = nullptr;
  FileStyle(name, style, replace, previous);
  return previous;
}

StyleSheet::NameIndex::iterator StyleSheet::FileStyle(const ZelStringT<char16_t>& name,
                                                      Style* style, bool replace,
                                                      Style*& previous) {
  previous = nullptr;
  const auto found = m_styles->lower_bound(name);
  const bool present = found != m_styles->end() && !m_styles->key_comp()(name, found->first);
  if (present && !replace) {
    // The style already in the sheet wins.
    delete style;
    return found;
  }
  Style* const removed = present ? found->second : nullptr;
  NameIndex::iterator filed;
  try {
    // Everything that allocates comes before the first change, so that a
    // failure leaves both indexes as they were.
    ZelStringT<char16_t> key = name;
    ZelStringT<char16_t> spelling = name;
    const auto [pointerEntry, newPointerEntry] = m_names->try_emplace(style);
    if (present) {
      // Replacing: the entry is taken out and put back under the caller's
      // spelling, which is what removing and adding again amounts to.
      const auto next = std::next(found);
      auto node = m_styles->extract(found);
      node.key() = std::move(key);
      node.mapped() = style;
      filed = m_styles->insert(next, std::move(node));
      if (removed != style)
        m_names->erase(removed);
    } else {
      try {
        filed = m_styles->emplace_hint(found, std::move(key), style);
      } catch (...) {
        if (newPointerEntry)
          m_names->erase(pointerEntry);
        throw;
      }
    }
    pointerEntry->second = std::move(spelling);
  } catch (...) {
    // The sheet owns the offered style even when it could not be filed.
    if (style != removed)
      delete style;
    throw;
  }
  previous = removed;
  return filed;
}

Style* StyleSheet::RemoveStyle(const ZelStringT<char16_t>& name) {
  const auto found = m_styles->find(name);
  if (found == m_styles->end())
    return nullptr;
  Style* style = found->second;
  m_names->erase(style);
  m_styles->erase(found);
  return style;
}

Style* StyleSheet::DetachByPointerEntry(PointerIndex::iterator entry) {
  const auto found = m_styles->find(entry->second);
  if (found == m_styles->end())
    return nullptr;
  Style* style = found->second;
  m_styles->erase(found);
  m_names->erase(style);
  return style;
}

bool StyleSheet::RemoveStyle(Style* style) {
  if (!style)
    return false;
  const auto found = m_names->find(style);
  if (found == m_names->end())
    return false;
  DetachByPointerEntry(found);
  return true;
}

void StyleSheet::DeleteStyles(StyleSpan styles) {
  // Every style drops its references first, the doomed ones included, so
  // that no surviving style is left pointing at a destroyed one.
  for (auto& entry : *m_styles)
    if (entry.second)
      entry.second->RemoveDependency(styles, true);
  for (Style* style : styles) {
    if (!style)
      continue;
    const auto found = m_names->find(style);
    if (found == m_names->end())
      continue; // foreign styles are left to their owner
    delete DetachByPointerEntry(found);
  }
}

void StyleSheet::RenameStyle(const ZelStringT<char16_t>& oldName,
                             const ZelStringT<char16_t>& newName) {
  if (oldName.CompareNoCase(newName) != 0 && m_styles->count(newName) != 0)
    return;
  const auto found = m_styles->find(oldName);
  if (found == m_styles->end())
    return;
  // Allocations first, so that a failure leaves both indexes as they were.
  ZelStringT<char16_t> nameKey = newName;
  ZelStringT<char16_t> nameValue = newName;
  const auto pointerEntry = m_names->try_emplace(found->second).first;
  auto node = m_styles->extract(found);
  node.key() = std::move(nameKey);
  m_styles->insert(std::move(node));
  pointerEntry->second = std::move(nameValue);
}

void StyleSheet::MergeIn(StyleSheet& other, bool replace) {
  // Walks this sheet's own index, not `other`'s: a long-standing behaviour
  // hosts rely on, kept as it is. Each style goes back into this sheet and
  // whatever AddStyle hands back is destroyed. A snapshot keeps the walk
  // valid while AddStyle changes the index.
  const std::vector<std::pair<ZelStringT<char16_t>, Style*>> own(m_styles->begin(),
                                                                 m_styles->end());
  for (const auto& entry : own)
    delete AddStyle(entry.first, entry.second, replace);
  other.m_styles->clear();
}

Style* StyleSheet::GetStyle(const ZelStringT<char16_t>& name) const {
  const auto found = m_styles->find(name);
  return found == m_styles->end() ? nullptr : found->second;
}

std::vector<Style*> StyleSheet::GetStyles() const {
  std::vector<Style*> styles;
  styles.reserve(m_styles->size());
  for (const auto& entry : *m_styles)
    styles.push_back(entry.second);
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
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->GetCategoryName() == category)
      styles.push_back(entry.second);
  return styles;
}

ZelStringT<char16_t> StyleSheet::GetStyleName(const Style* style) const {
  if (!style)
    return ZelStringT<char16_t>();
  const auto found = m_names->find(style);
  return found == m_names->end() ? ZelStringT<char16_t>() : found->second;
}

std::vector<ZelStringT<char16_t>> StyleSheet::GetStyleNames() const {
  std::vector<ZelStringT<char16_t>> names;
  names.reserve(m_styles->size());
  for (const auto& entry : *m_styles)
    names.push_back(entry.first);
  return names;
}

std::vector<ZelStringT<char16_t>> StyleSheet::GetStyleNames(const PropertyKey& category) const {
  std::vector<ZelStringT<char16_t>> names;
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->GetCategoryName() == category)
      names.push_back(entry.first);
  return names;
}

StyleSheet::NameIndex StyleSheet::GetChildStyles(const Style* parent) const {
  NameIndex children;
  if (!parent)
    return children;
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->GetParent() == parent)
      children.emplace_hint(children.end(), entry.first, entry.second);
  return children;
}

void StyleSheet::GenerateCategoryStyleMap(CategoryStyleMap& out) const {
  out.clear();
  for (const auto& entry : *m_styles) {
    if (!entry.second)
      continue;
    NameIndex& styles = out[entry.second->GetCategoryName()];
    styles.emplace_hint(styles.end(), entry.first, entry.second);
  }
}

void StyleSheet::GetDependencies(StyleSpan styles, std::vector<Style*>& out) const {
  for (const auto& entry : *m_styles)
    if (entry.second && entry.second->HasDependency(styles, false))
      out.push_back(entry.second);
}

Style* StyleSheet::GetExternalStyleAlias(const ZelStringT<char16_t>& externalID,
                                         const ZelStringT<char16_t>& externalName) const {
  if (externalID.IsEmpty() || externalName.IsEmpty())
    return nullptr;
  for (const auto& entry : *m_styles) {
    const Style* style = entry.second;
    if (style && style->GetExternalID().Compare(externalID, 0) == 0 &&
        style->GetExternalName().Compare(externalName, 0) == 0)
      return entry.second;
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
    return m_styles->find(name) != m_styles->end();
  });
}

void StyleSheet::CopyContentsFrom(const StyleSheet& source,
                                  IStyleSheetDuplicationContext* context) {
  Clear();
  ZelStringT<char16_t> text;
  source.ExportToString(text, true);
  ImportFromString(text, true);
  if (context)
    for (const auto& entry : *m_styles)
      context->OnStyleDuplicated(entry.second, 0);
  m_version = source.m_version;
}

void StyleSheet::ExportJson(JsonValue& out, bool includeTemporary) const {
  Json::Object& document = out.Get<Json::Object>();
  CategoryStyleMap categories;
  GenerateCategoryStyleMap(categories);
  if (m_version > 0)
    document.AddValue(k_strVersion, Json::Value(m_version));
  if (!m_externalID.IsEmpty())
    document.AddValue(k_strExternalID, Json::Value(m_externalID));
  for (const auto& category : categories) {
    Json::Object styles;
    styles.Reserve(category.second.size());
    for (const auto& [name, style] : category.second) {
      Json::Value json;
      style->Serialize(*this, json, includeTemporary);
      styles.AddValue(name, std::move(json));
    }
    document.AddValue(category.first.GetString(), Json::Value(std::move(styles)));
  }
}

bool StyleSheet::ImportJson(Json::Object* document, bool replace) {
  assert(document && "ImportJson needs a document");
  if (!document)
    return false;
  StyleManager& manager = GetStyleManager();
  // Styles made by this import, sorted after the first pass; only they are
  // read, so styles that were in the sheet before are never read into.
  std::vector<const Style*> created;
  // The name-index entry filed under each style member's name, in document
  // order. Import never erases an entry (a replacement re-files it), so the
  // second pass reads each entry instead of searching for the name again.
  std::vector<const NameIndex::value_type*> filed;
  bool versionSeen = false;

  // The members are gone through twice. The first pass makes an empty style
  // for every name, so that every reference resolves when the second pass
  // reads the styles; the version and the ID are applied in both.
  const std::size_t memberCount = document->GetSize();
  for (int pass = 0; pass < 2; ++pass) {
    std::size_t next = 0;
    for (std::size_t i = 0; i < memberCount; ++i) {
      const ZelStringT<char16_t>& name = document->GetValueName(i);
      const Json::Value& value = document->GetValue(i);
      if (const Json::Object* category = value.GetIf<Json::Object>()) {
        if (!manager.CategoryExists(name))
          continue;
        const std::size_t styleCount = category->GetSize();
        if (pass == 0) {
          for (std::size_t j = 0; j < styleCount; ++j) {
            category->GetValue(j).Get<Json::Object>(); // std::bad_cast for a non-object
            std::unique_ptr<Style> style(new Style);
            created.push_back(style.get());
            Style* previous = nullptr;
            const auto entry =
                FileStyle(category->GetValueName(j), style.release(), replace, previous);
            delete previous;
            filed.push_back(&*entry);
          }
          continue;
        }
        const PropertyKey categoryKey(name);
        for (std::size_t j = 0; j < styleCount; ++j) {
          Style* style = filed[next++]->second;
          if (!std::binary_search(created.begin(), created.end(), style))
            continue;
          style->SetCategory(categoryKey);
          style->DeserializeJson(*this, category->GetValue(j).Get<Json::Object>());
          if (!m_externalID.IsEmpty())
            style->SetExternalID(m_externalID);
        }
      } else if (const double* number = value.GetIf<double>()) {
        if (NameEquals(name, k_strVersion)) {
          m_version = TruncateVersion(*number);
          versionSeen = true;
        }
      } else if (const ZelStringT<char16_t>* text = value.GetIf<ZelStringT<char16_t>>()) {
        // The document's ID is taken only by a sheet that already has one.
        if (NameEquals(name, k_strExternalID) && !m_externalID.IsEmpty())
          m_externalID = *text;
      }
    }
    // An address freed in the first pass can only have been reused by a
    // style made later in it, so membership in `created` stays exact.
    if (pass == 0)
      std::sort(created.begin(), created.end());
  }

  if (!versionSeen)
    m_version = 0;
  return true;
}

bool StyleSheet::ImportFromString(const ZelStringT<char16_t>& text, bool replace) {
  Json::Value value;
  ZelStringT<char16_t> errorText;
  try {
    if (!Json::Parse(text, value, errorText))
      return false;
  } catch (...) {
    return false;
  }
  Json::Object* document = value.GetIf<Json::Object>();
  if (!document)
    return false;
  return ImportJson(document, replace);
}

void StyleSheet::ExportToString(ZelStringT<char16_t>& text, bool includeTemporary) const {
  JsonValue value{Json::Object()};
  ExportJson(value, includeTemporary);
  text = Json::ValueToString(value, false);
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
