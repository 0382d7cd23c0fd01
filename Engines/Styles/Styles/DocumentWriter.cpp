// The document writer: a sheet's document, as a value tree or straight as
// text, styles grouped by category and in name order; StyleSheet's export
// operations are defined here.
#include <Styles/Internal/DocumentWriter.h>

#include <Styles/StyleSheet.h>

#include <Styles/Internal/DocumentFormat.h>
#include <Styles/Internal/StyleIndex.h>
#include <Styles/Internal/StyleJson.h>

#include <Json/Json.h>
#include <ZelUtils/TextStream.h>

#include <map>
#include <typeinfo>
#include <utility>
#include <vector>

namespace Styles {
namespace detail {

namespace {

using Groups = std::map<PropertyKey, std::vector<const StyleIndex::Entry*>>;

// The filed styles by category (in key order), each list in name order, in
// one pass over the styles; `units` receives a generous guess of the length
// of their text.
Groups GroupByCategory(const StyleIndex& index, std::size_t& units) {
  Groups categories;
  units = 64;
  std::vector<const StyleIndex::Entry*>* group = nullptr;
  PropertyKey groupKey;
  for (const StyleIndex::Entry* entry : index.Ordered()) {
    if (!entry->style)
      continue;
    // The map is searched only when the category differs from the last one.
    const PropertyKey category = entry->style->GetCategoryName();
    if (!group || category != groupKey) {
      group = &categories[category];
      groupKey = category;
    }
    group->push_back(entry);
    units += entry->nameLength + 32 + 48 * entry->style->GetProperties().size();
  }
  return categories;
}

} // namespace

void DocumentWriter::WriteTree(const StyleSheet& sheet, JsonValue& out, bool includeTemporary) {
  Json::Object& document = out.Get<Json::Object>();
  std::size_t units = 0;
  const Groups categories = GroupByCategory(*sheet.m_index, units);
  if (sheet.m_version > 0)
    document.AddValue(k_strVersion, Json::Value(sheet.m_version));
  if (!sheet.m_externalID.IsEmpty())
    document.AddValue(k_strExternalID, Json::Value(sheet.m_externalID));
  for (const auto& [category, entries] : categories) {
    Json::Object styles;
    styles.Reserve(entries.size());
    for (const StyleIndex::Entry* entry : entries) {
      Json::Value json;
      StyleJson::Write(*entry->style, sheet, json, includeTemporary);
      styles.AddValue(ZelStringT<char16_t>(entry->Name()), std::move(json));
    }
    document.AddValue(category.GetString(), Json::Value(std::move(styles)));
  }
}

void DocumentWriter::WriteText(const StyleSheet& sheet, ZelStringT<char16_t>& text,
                               bool includeTemporary) {
  // The same text as ExportJson's tree would give, written without the tree.
  // A generous guess of the text's length saves the text's growth steps.
  std::size_t estimate = 0;
  const Groups categories = GroupByCategory(*sheet.m_index, estimate);
  Json::Writer writer(false);
  writer.ReuseStorage(text);
  writer.Reserve(estimate);
  writer.StartObject();
  if (sheet.m_version > 0) {
    writer.Key(k_strVersion);
    writer.Write(Json::Value(sheet.m_version));
  }
  if (!sheet.m_externalID.IsEmpty()) {
    writer.Key(k_strExternalID);
    writer.String(sheet.m_externalID.GetView());
  }
  StyleJson::TextScratch scratch(sheet, includeTemporary);
  for (const auto& [category, entries] : categories) {
    writer.Key(category.GetView());
    writer.StartObject();
    for (const StyleIndex::Entry* entry : entries) {
      writer.Key(entry->Name());
      StyleJson::Write(*entry->style, sheet, writer, includeTemporary, scratch);
    }
    writer.EndObject();
  }
  writer.EndObject();
  text = writer.TakeText();
}

} // namespace detail

void StyleSheet::ExportJson(JsonValue& out, bool includeTemporary) const {
  detail::DocumentWriter::WriteTree(*this, out, includeTemporary);
}

void StyleSheet::ExportToString(ZelStringT<char16_t>& text, bool includeTemporary) const {
  if (typeid(*this) != typeid(StyleSheet)) {
    // A derived sheet may write its own document: go through ExportJson.
    JsonValue value{Json::Object()};
    ExportJson(value, includeTemporary);
    text = Json::ValueToString(value, false);
    return;
  }
  detail::DocumentWriter::WriteText(*this, text, includeTemporary);
}

bool StyleSheet::Export(ZelUtils::Stream& stream) const {
  ZelStringT<char16_t> text;
  ExportToString(text, false);
  ZelUtils::TextStreamWriter writer(stream, detail::kDocumentEncoding, false);
  return writer.Write(text);
}

} // namespace Styles
