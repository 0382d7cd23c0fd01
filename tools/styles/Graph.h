// The inheritance graph of a sheet: each category's styles with the parents
// they inherit from, and the substyles that inherit from styles elsewhere.
// `styles graph` writes it as Graphviz DOT; `styles report` draws it.
#pragma once

#include "Output.h"

#include <ostream>
#include <string>
#include <vector>

namespace StylesCommand {

// The styles of one category, ordered by name ignoring letter case. The
// styles belong to the sheet they were listed from.
struct CategoryStyles {
  Text key;
  Text name; // the category's name for people
  std::vector<std::pair<Text, const Styles::Style*>> styles;
};

// The categories that have styles in `sheet`, ordered by key text.
std::vector<CategoryStyles> ListCategories(const Styles::StyleSheet& sheet);

// A substyle held by a style, at `path` ("character", "cells[1]"), and the
// sheet style it inherits from: empty `parent` when it inherits from none, or
// from a style that is no style of the sheet.
struct SubstyleLink {
  Text path;
  Text parent;
  Text parentCategory;
};

// Every substyle that `style` owns, at any depth, in the order the categories
// register their properties.
std::vector<SubstyleLink> ListSubstyles(const Styles::StyleSheet& sheet,
                                        const Styles::Style& style);

// The graph as a Graphviz digraph named `title`: one cluster per category,
// parents above children, and a dashed edge from each style a substyle
// inherits from to the substyle's owner.
void WriteDot(const Styles::StyleSheet& sheet, const std::string& title, std::ostream& out);

} // namespace StylesCommand
