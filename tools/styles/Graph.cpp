#include "Graph.h"

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <map>

namespace StylesCommand {

using Styles::Style;
using Styles::StyleSheet;

namespace {

void CollectSubstyles(const StyleSheet& sheet, const Style& style, const Text& prefix,
                      std::vector<SubstyleLink>& out) {
  const Styles::StyleCategory* category = style.GetCategory().get();
  if (!category)
    return;
  for (const Styles::PropertyKey& key : category->GetPropertyOrder()) {
    const ZelUtils::Any* value = style.GetProperties().Find(key);
    if (!value)
      continue;
    const Text path = prefix + key.GetString();
    std::vector<std::pair<Text, const Style*>> held;
    if (Style* const* substyle = value->GetIf<Style*>()) {
      if (*substyle)
        held.emplace_back(path, *substyle);
    } else if (const auto* list = value->GetIf<std::vector<Style*>>()) {
      for (std::size_t i = 0; i < list->size(); ++i)
        if ((*list)[i])
          held.emplace_back(path + u"[" + FromUtf8(std::to_string(i)) + u"]", (*list)[i]);
    }
    for (const auto& [heldPath, substyle] : held) {
      const Style* parent = substyle->GetParent();
      const Text parentName = sheet.GetStyleName(parent);
      out.push_back(
          SubstyleLink{heldPath, parentName,
                       parentName.IsEmpty() ? Text() : parent->GetCategoryName().GetString()});
      CollectSubstyles(sheet, *substyle, heldPath + u".", out);
    }
  }
}

// Text in double quotes for DOT, with quotes and backslashes escaped.
std::string DotText(const Text& text) {
  std::string quoted = "\"";
  for (const char c : ToUtf8(text)) {
    if (c == '"' || c == '\\')
      quoted += '\\';
    quoted += c == '\n' ? ' ' : c;
  }
  return quoted + '"';
}

Text NodeId(const Text& category, const Text& name) { return category + u"/" + name; }

} // namespace

std::vector<CategoryStyles> ListCategories(const StyleSheet& sheet) {
  StyleSheet::CategoryStyleMap categories;
  sheet.GenerateCategoryStyleMap(categories);
  std::map<Text, CategoryStyles> ordered;
  for (const auto& [key, styles] : categories) {
    if (styles.empty())
      continue;
    CategoryStyles& entry = ordered[key.GetString()];
    entry.key = key.GetString();
    entry.name = styles.begin()->second->GetCategoryUIName();
    for (const auto& [name, style] : styles)
      entry.styles.emplace_back(name, style);
  }
  std::vector<CategoryStyles> list;
  for (auto& entry : ordered)
    list.push_back(std::move(entry.second));
  return list;
}

std::vector<SubstyleLink> ListSubstyles(const StyleSheet& sheet, const Style& style) {
  std::vector<SubstyleLink> links;
  CollectSubstyles(sheet, style, Text(), links);
  return links;
}

void WriteDot(const StyleSheet& sheet, const std::string& title, std::ostream& out) {
  out << "digraph " << DotText(FromUtf8(title)) << " {\n"
      << "  node [shape=box, style=rounded];\n";
  std::string links;
  for (const CategoryStyles& category : ListCategories(sheet)) {
    out << "  subgraph " << DotText(u"cluster_" + category.key) << " {\n"
        << "    label=" << DotText(category.name) << ";\n";
    for (const auto& [name, style] : category.styles)
      out << "    " << DotText(NodeId(category.key, name)) << " [label=" << DotText(name) << "];\n";
    for (const auto& [name, style] : category.styles) {
      const Style* parent = style->GetParent();
      const Text parentName = sheet.GetStyleName(parent);
      const Text parentCategory =
          parentName.IsEmpty() ? Text() : parent->GetCategoryName().GetString();
      // An edge that names a node first places it in the current cluster, so
      // edges that cross clusters follow all the clusters.
      const std::string edge = DotText(NodeId(parentCategory, parentName)) + " -> " +
                               DotText(NodeId(category.key, name));
      if (parentCategory == category.key)
        out << "    " << edge << ";\n";
      else if (!parentName.IsEmpty())
        links += "  " + edge + ";\n";
      for (const SubstyleLink& link : ListSubstyles(sheet, *style))
        if (!link.parent.IsEmpty())
          links += "  " + DotText(NodeId(link.parentCategory, link.parent)) + " -> " +
                   DotText(NodeId(category.key, name)) +
                   " [style=dashed, label=" + DotText(link.path) + "];\n";
    }
    out << "  }\n";
  }
  out << links << "}\n";
}

} // namespace StylesCommand
