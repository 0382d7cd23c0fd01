// Dropping the substyle parents that lead back to the style holding them,
// which the document reader does once an import has made every link.
#include <Styles/Internal/SubstyleCycles.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>

#include <algorithm>
#include <cstddef>
#include <unordered_map>

namespace Styles {
namespace detail {

void DropSubstyleCycles(const std::vector<Style*>& roots) {
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
      const StyleCategory* category = holder->GetCategory().get();
      for (const PropertyMap::ConstEntry& entry : holder->GetProperties())
        if (const BaseStyleProperty* behaviour =
                category ? category->GetStyleProperty(entry.first) : nullptr)
          behaviour->ProcessStylesInProperty(entry.second, [&](Style* substyle) {
            if (substyle) {
              if (substyle->GetParent())
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
        const Style* to =
            node.next == 0 ? style->GetParent() : node.linked[node.next - 1]->GetParent();
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
      const auto found = nodes.find(substyle->GetParent());
      if (found != nodes.end() && found->second.low == node.low)
        substyle->SetParent(nullptr);
    }
}

} // namespace detail
} // namespace Styles
