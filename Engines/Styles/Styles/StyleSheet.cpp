#include <Styles/StyleSheet.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>

#include <Json/Json.h>
#include <ZelUtils/TextStream.h>

#include <cassert>
#include <climits>
#include <cmath>
#include <memory>
#include <unordered_set>
#include <utility>

namespace Styles {

namespace {

// Member names of the document object.
constexpr char16_t k_strVersion[] = u"version";
constexpr char16_t k_strExternalID[] = u"id";

// The byte encoding of documents in streams (UTF-8), the same both ways.
constexpr ZelUtils::TextStream::Encoding kDocumentEncoding =
    static_cast<ZelUtils::TextStream::Encoding>(3);

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
  Style* previous = replace ? RemoveStyle(name) : nullptr;
  const auto found = m_styles->lower_bound(name);
  if (found != m_styles->end() && !m_styles->key_comp()(name, found->first)) {
    // Only possible without `replace`: the style already in the sheet wins.
    delete style;
    return previous;
  }
  const auto inserted = m_styles->emplace_hint(found, name, style);
  try {
    (*m_names)[style] = name;
  } catch (...) {
    m_styles->erase(inserted);
    throw;
  }
  return previous;
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

bool StyleSheet::RemoveStyle(Style* style) {
  if (!style)
    return false;
  const auto found = m_names->find(style);
  if (found == m_names->end())
    return false;
  const ZelStringT<char16_t> name = found->second;
  RemoveStyle(name);
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
    const ZelStringT<char16_t> name = found->second;
    delete RemoveStyle(name);
  }
}

void StyleSheet::RenameStyle(const ZelStringT<char16_t>& oldName,
                             const ZelStringT<char16_t>& newName) {
  if (oldName.CompareNoCase(newName) != 0 && m_styles->count(newName) != 0)
    return;
  const auto found = m_styles->find(oldName);
  if (found == m_styles->end())
    return;
  // Copies first, so that a failed allocation leaves both indexes as they were.
  ZelStringT<char16_t> nameKey = newName;
  ZelStringT<char16_t> nameValue = newName;
  const auto pointerEntry = m_names->find(found->second);
  auto node = m_styles->extract(found);
  node.key() = std::move(nameKey);
  m_styles->insert(std::move(node));
  if (pointerEntry != m_names->end())
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
    if (category.second.empty())
      continue;
    Json::Object styles;
    styles.Reserve(category.second.size());
    for (const auto& entry : category.second) {
      Json::Value style;
      entry.second->Serialize(*this, style, includeTemporary);
      styles.AddValue(entry.first, std::move(style));
    }
    document.AddValue(category.first.GetString(), Json::Value(std::move(styles)));
  }
}

bool StyleSheet::ImportJson(Json::Object* document, bool replace) {
  assert(document && "ImportJson needs a document");
  if (!document)
    return false;
  StyleManager& manager = GetStyleManager();
  // Styles made by this import; only they are read in the second pass, so
  // styles that were in the sheet before are never read into.
  std::unordered_set<const Style*> created;
  bool versionSeen = false;

  // First pass: an empty style for every name, plus the version and the ID,
  // so that every reference can be resolved when the styles are read.
  const std::size_t memberCount = document->GetSize();
  for (std::size_t i = 0; i < memberCount; ++i) {
    const ZelStringT<char16_t>& name = document->GetValueName(i);
    const Json::Value& value = document->GetValue(i);
    if (const Json::Object* category = value.GetIf<Json::Object>()) {
      if (!manager.CategoryExists(name))
        continue;
      for (std::size_t j = 0; j < category->GetSize(); ++j) {
        category->GetValue(j).Get<Json::Object>(); // std::bad_cast for a non-object
        const ZelStringT<char16_t>& styleName = category->GetValueName(j);
        std::unique_ptr<Style> style(new Style);
        created.insert(style.get());
        Style* added = style.release();
        Style* previous = AddStyle(styleName, added, replace);
        if (m_names->find(added) == m_names->end())
          created.erase(added); // lost the clash and was destroyed
        if (previous) {
          created.erase(previous);
          delete previous;
        }
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

  // Second pass: read the new styles.
  for (std::size_t i = 0; i < memberCount; ++i) {
    const ZelStringT<char16_t>& name = document->GetValueName(i);
    const Json::Object* category = document->GetValue(i).GetIf<Json::Object>();
    if (!category || !manager.CategoryExists(name))
      continue;
    const PropertyKey categoryKey(name);
    for (std::size_t j = 0; j < category->GetSize(); ++j) {
      Style* style = GetStyle(category->GetValueName(j));
      if (!style || created.count(style) == 0)
        continue;
      style->SetCategory(categoryKey);
      style->DeserializeJson(*this, category->GetValue(j).Get<Json::Object>());
      if (!m_externalID.IsEmpty())
        style->SetExternalID(m_externalID);
    }
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
