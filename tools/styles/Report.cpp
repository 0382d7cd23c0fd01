#include "Report.h"

#include <SystemIO/AtomicFile.h>

#include "Commands.h"
#include "Graph.h"

#include <StylesTools/Diff.h>
#include <StylesTools/Provenance.h>

#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelUtils/String.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <iostream>
#include <map>
#include <unordered_map>

namespace StylesCommand {

using Styles::Style;
using Styles::StyleSheet;
using Styles::Tools::Difference;
using Styles::Tools::ValueSource;

namespace {

// Where the page's template takes the data.
constexpr std::string_view kDataMarker = "@STYLES_REPORT_DATA@";

using NameToIndex = std::map<Text, std::size_t, ZelUtils::String::LessThanCaseInsensitive>;

const char16_t* SourceName(ValueSource source) {
  switch (source) {
  case ValueSource::Own:
    return u"own";
  case ValueSource::Ancestor:
    return u"ancestor";
  case ValueSource::Owner:
    return u"owner";
  case ValueSource::Default:
    break;
  }
  return u"default";
}

const char16_t* KindName(Difference::Kind kind) {
  switch (kind) {
  case Difference::Kind::Added:
    return u"added";
  case Difference::Kind::Removed:
    return u"removed";
  case Difference::Kind::ParentChanged:
    return u"parent";
  case Difference::Kind::ValueChanged:
    return u"value";
  case Difference::Kind::EffectiveChanged:
    break;
  }
  return u"effective";
}

Json::Value TextOrNull(const Text& text, bool present) {
  return present ? Json::Value(text) : Json::Value();
}

Json::Array Row(std::initializer_list<Json::Value> items) {
  Json::Array row;
  for (const Json::Value& item : items)
    row.AddValue(item);
  return row;
}

// One style: its parent, substyles and effective values with their sources.
Json::Object DescribeStyleData(const StyleSheet& sheet, const Text& name, const Style& style,
                               std::size_t category,
                               const std::unordered_map<const Style*, std::size_t>& indexOf) {
  Json::Object item;
  item.AddValue(u"name", Json::Value(name));
  item.AddValue(u"category", Json::Value(category));
  const auto parent = indexOf.find(style.GetParent());
  item.AddValue(u"parent", parent == indexOf.end() ? Json::Value() : Json::Value(parent->second));
  Json::Array values;
  for (const Styles::Tools::EffectiveValue& value : Styles::Tools::ListEffectiveValues(style)) {
    const Styles::Tools::Resolution& resolution = value.resolution;
    const bool inherited =
        resolution.source == ValueSource::Ancestor || resolution.source == ValueSource::Owner;
    values.AddValue(Json::Value(
        Row({Json::Value(value.path),
             Json::Value(Styles::Tools::FormatValue(*value.behaviour, *resolution.value)),
             Json::Value(SourceName(resolution.source)),
             inherited ? Json::Value(Styles::Tools::DescribeStyle(sheet, resolution.holder))
                       : Json::Value()})));
  }
  item.AddValue(u"values", Json::Value(std::move(values)));
  Json::Array substyles;
  for (const SubstyleLink& link : ListSubstyles(sheet, style))
    substyles.AddValue(
        Json::Value(Row({Json::Value(link.path), TextOrNull(link.parent, !link.parent.IsEmpty()),
                         Json::Value(link.parentCategory)})));
  item.AddValue(u"substyles", Json::Value(std::move(substyles)));
  return item;
}

// The JSON text of `value`, safe inside a <script> element: "<" appears only
// within strings, where its escape means the same.
std::string ScriptSafeJson(const Json::Value& value) {
  const Text json = Json::ValueToString(value, false);
  std::u16string safe;
  safe.reserve(json.GetLength());
  for (const char16_t c : json.GetView()) {
    if (c == u'<')
      safe += u"\\u003c";
    else
      safe += c;
  }
  return ToUtf8(Text(safe));
}

} // namespace

std::string BuildReport(const StyleSheet& sheet, const std::string& title,
                        const StyleSheet* oldSheet, const std::string& oldTitle) {
  std::vector<CategoryStyles> categories = ListCategories(sheet);
  // Categories only the old sheet has still show the styles removed from them.
  std::map<Text, std::size_t> categoryIndex;
  for (std::size_t i = 0; i < categories.size(); ++i)
    categoryIndex.emplace(categories[i].key, i);
  if (oldSheet)
    for (CategoryStyles& old : ListCategories(*oldSheet))
      if (categoryIndex.emplace(old.key, categories.size()).second)
        categories.push_back(CategoryStyles{old.key, old.name, {}});

  // Styles are numbered in the order they are written into the page.
  std::unordered_map<const Style*, std::size_t> indexOf;
  std::vector<NameToIndex> byName(categories.size());
  std::size_t count = 0;
  for (std::size_t c = 0; c < categories.size(); ++c)
    for (const auto& [name, style] : categories[c].styles) {
      byName[c].emplace(name, count);
      indexOf.emplace(style, count++);
    }

  Json::Array styles;
  for (std::size_t c = 0; c < categories.size(); ++c)
    for (const auto& [name, style] : categories[c].styles)
      styles.AddValue(Json::Value(DescribeStyleData(sheet, name, *style, c, indexOf)));

  // Differences go to the style they concern; removed styles to their category.
  std::vector<Json::Array> changes(count);
  std::vector<Json::Array> removed(categories.size());
  if (oldSheet)
    for (const Difference& d : Styles::Tools::DiffSheets(*oldSheet, sheet, true)) {
      const auto category = categoryIndex.find(d.category.GetString());
      if (category == categoryIndex.end())
        continue;
      const std::size_t c = category->second;
      if (d.kind == Difference::Kind::Removed) {
        removed[c].AddValue(Json::Value(d.style));
        continue;
      }
      const auto found = byName[c].find(d.style);
      if (found == byName[c].end())
        continue;
      changes[found->second].AddValue(
          Json::Value(Row({Json::Value(KindName(d.kind)), Json::Value(d.path),
                           TextOrNull(d.oldValue, d.hasOld), TextOrNull(d.newValue, d.hasNew)})));
    }

  Json::Array categoriesJson;
  for (std::size_t c = 0; c < categories.size(); ++c) {
    Json::Object category;
    category.AddValue(u"key", Json::Value(categories[c].key));
    category.AddValue(u"name", Json::Value(categories[c].name));
    category.AddValue(u"removed", Json::Value(std::move(removed[c])));
    categoriesJson.AddValue(Json::Value(std::move(category)));
  }
  Json::Array changesJson;
  for (Json::Array& list : changes)
    changesJson.AddValue(Json::Value(std::move(list)));

  Json::Object data;
  data.AddValue(u"document", Json::Value(FromUtf8(title)));
  data.AddValue(u"against", TextOrNull(FromUtf8(oldTitle), oldSheet != nullptr));
  data.AddValue(u"categories", Json::Value(std::move(categoriesJson)));
  data.AddValue(u"styles", Json::Value(std::move(styles)));
  data.AddValue(u"changes", Json::Value(std::move(changesJson)));

  std::string page(ReportTemplate());
  const std::size_t at = page.find(kDataMarker);
  if (at != std::string::npos)
    page.replace(at, kDataMarker.size(), ScriptSafeJson(Json::Value(std::move(data))));
  return page;
}

int WriteOutput(const std::string& text, const std::string& path) {
  if (path.empty() || path == "-") {
    std::cout << text; // collected and checked when the command finishes
    return kSuccess;
  }
  // Renamed over the target when complete: never half a file, nor debris.
  std::string error;
  if (!SystemIO::WriteFileAtomically(path, text, &error)) {
    Output::Error(path, "cannot be written: " + error);
    return kUnreadable;
  }
  return kSuccess;
}

} // namespace StylesCommand
