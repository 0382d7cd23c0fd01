// The document reader: both passes of an import, parent-cycle refusal
// through the parent forest, the repair of replaced styles and the dropping
// of substyle cycles; StyleSheet's import operations are defined here.
#include <Styles/Internal/DocumentReader.h>

#include <Styles/StyleManager.h>
#include <Styles/StyleSheet.h>

#include <Styles/Internal/DocumentFormat.h>
#include <Styles/Internal/DocumentVersion.h>
#include <Styles/Internal/JsonAccess.h>
#include <Styles/Internal/ParentForest.h>
#include <Styles/Internal/StyleIndex.h>
#include <Styles/Internal/StyleJson.h>
#include <Styles/Internal/SubstyleCycles.h>

#include <Json/Json.h>
#include <ZelUtils/TextStream.h>

#include <cassert>
#include <cstdint>
#include <map>
#include <optional>
#include <typeinfo>
#include <utility>
#include <vector>

namespace Styles {
namespace detail {

namespace {

// Points the sheet's import bookkeeping at a forest for as long as it lives.
class ImportScope {
public:
  explicit ImportScope(ParentForest*& slot) : m_slot(slot), m_previous(slot) { slot = &m_forest; }
  ~ImportScope() { m_slot = m_previous; }
  ImportScope(const ImportScope&) = delete;
  ImportScope& operator=(const ImportScope&) = delete;

private:
  ParentForest m_forest;
  ParentForest*& m_slot;
  ParentForest* m_previous;
};

// How many styles ahead a pass over a category asks for a name's memory.
constexpr std::size_t kNamesAhead = 8;

// Asks for the memory of `text` before it is read.
void Prefetch(std::u16string_view text) { __builtin_prefetch(text.data()); }

} // namespace

template <class Access>
void DocumentReader::Import(StyleSheet& sheet, const typename Access::Object& document,
                            bool replace) {
  StyleManager& manager = GetStyleManager();
  // Entries that hold a style made by this import carry its stamp; only
  // those styles are read, so styles that were in the sheet before are never
  // read into.
  const std::uint32_t stamp = sheet.m_index->NextImportStamp();
  // The index entry filed under each style member's name, in document order.
  // Import never erases an entry (a replacement re-files it), so the second
  // pass reads each entry instead of searching for the name again.
  std::vector<StyleIndex::Entry*> filed;
  // Styles that replacements took out of the sheet, with the entry of the
  // name each held. They are destroyed after the first pass, once every style
  // that referred to one refers to the style holding its name at that time.
  std::vector<std::pair<Style*, const StyleIndex::Entry*>> replaced;
  const auto repairReplaced = [&sheet, &replaced] {
    std::map<Style*, Style*> heirs;
    for (const auto& [old, entry] : replaced)
      heirs[old] = entry->style;
    sheet.Redirect(heirs);
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
        sheet.m_version = TruncateVersion(*number);
        versionSeen = true;
      }
    } else if (const std::optional<std::u16string_view> text = Access::AsString(value)) {
      // The document's ID is taken only by a sheet that already has one.
      if (name == k_strExternalID && !sheet.m_externalID.IsEmpty())
        sheet.m_externalID = ZelStringT<char16_t>(*text);
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
    std::size_t styleCount = sheet.m_index->Size();
    for (std::size_t i = 0; i < memberCount; ++i)
      if (const auto category = Access::AsObject(Access::Member(document, i)))
        styleCount += Access::Size(*category);
    sheet.m_index->Reserve(styleCount);
    forEachMember([&](const PropertyKey&, const typename Access::Object& category) {
      for (std::size_t j = 0; j < Access::Size(category); ++j) {
        // Names lie far apart in a large text: fetch one a few styles ahead.
        if (j + kNamesAhead < Access::Size(category))
          Prefetch(Access::Name(category, j + kNamesAhead));
        Access::RequireObject(Access::Member(category, j)); // std::bad_cast for a non-object
        // Room first, so that nothing below can throw once a style is out.
        MakeRoomForOne(filed);
        MakeRoomForOne(replaced);
        Style* style = new Style;
        Style* previous = nullptr;
        // FileStyle owns `style`, also when it throws.
        const auto [entry, isFiled] =
            sheet.m_index->File(Access::Name(category, j), style, replace, previous);
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

  const ImportScope scope(sheet.m_import);
  // The styles read, and after a replacement every style (a redirected
  // substyle may now inherit from a style read), are checked for substyles
  // that inherit their way back to the style holding them: once every link
  // is known, also when a behaviour throws.
  const auto dropContainedParents = [&] {
    if (!anyReplaced && !sheet.m_import->SubstyleLinked())
      return;
    std::vector<Style*> roots;
    if (anyReplaced) {
      roots = sheet.GetStyles();
    } else {
      for (const StyleIndex::Entry* entry : filed)
        if (entry->importStamp == stamp)
          roots.push_back(entry->style);
    }
    DropSubstyleCycles(roots);
  };
  try {
    StyleJson::ReadScratch scratch;
    std::size_t next = 0;
    forEachMember([&](const PropertyKey& categoryKey, const typename Access::Object& category) {
      for (std::size_t j = 0; j < Access::Size(category); ++j) {
        // The text of a style a few ahead, and the style it is read into.
        if (j + kNamesAhead < Access::Size(category)) {
          const auto ahead = Access::AsObject(Access::Member(category, j + kNamesAhead));
          if (ahead && Access::Size(*ahead) > 0)
            Prefetch(Access::Name(*ahead, 0));
          __builtin_prefetch(filed[next + kNamesAhead]->style);
        }
        const StyleIndex::Entry* entry = filed[next++];
        if (entry->importStamp != stamp)
          continue;
        Style* style = entry->style;
        sheet.m_import->SetReading(style);
        style->SetCategory(categoryKey);
        StyleJson::Read<Access>(*style, sheet, Access::RequireObject(Access::Member(category, j)),
                                scratch);
        if (!sheet.m_externalID.IsEmpty())
          style->SetExternalID(sheet.m_externalID);
      }
    });
  } catch (...) {
    dropContainedParents();
    throw;
  }
  dropContainedParents();

  if (!versionSeen)
    sheet.m_version = 0;
}

} // namespace detail

bool StyleSheet::ImportJson(Json::Object* document, bool replace) {
  assert(document && "ImportJson needs a document");
  if (!document)
    return false;
  detail::DocumentReader::Import<detail::TreeAccess>(*this, *document, replace);
  return true;
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
  // The same import as ImportJson's, read from a compact parse of the text,
  // whose strings stay in `text`.
  Json::Document document;
  ZelStringT<char16_t> errorText;
  try {
    if (!document.ParseBorrowed(text, errorText))
      return false;
  } catch (...) {
    return false;
  }
  const Json::Document::Ref root = document.GetRoot();
  if (!root.IsObject())
    return false;
  detail::DocumentReader::Import<detail::DocumentAccess>(*this, root, replace);
  return true;
}

bool StyleSheet::Import(ZelUtils::Stream& stream, bool replace) {
  ZelUtils::TextStreamReader reader(stream, detail::kDocumentEncoding);
  const ZelStringT<char16_t> text = reader.ReadToEnd();
  return ImportFromString(text, replace);
}

} // namespace Styles
