// Cost of Style::GetProperty: a hit in the style's own values, and misses that
// walk 1, 4 or 16 parents. Many chains are built and visited in shuffled order
// so that caches do not flatter the numbers. The "NodeMap" variants run the
// same walk over std::map nodes, the layout the flat arrays replace.
#include <Styles/Styles.h>

#include <benchmark/benchmark.h>

#include <algorithm>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <vector>

namespace {

using Styles::PropertyKey;
using Styles::Style;
using ZelUtils::Any;

constexpr int kKeysPerCategory = 16;
constexpr int kOwnValuesPerStyle = 10;

bool IsNumber(const Any& value) { return value.IsTypeCompatible<double>(); }

// One category with kKeysPerCategory number properties, registered once.
const std::vector<PropertyKey>& Keys() {
  static const std::vector<PropertyKey> keys = [] {
    Styles::StyleManager& manager = Styles::GetStyleManager();
    const PropertyKey category(u"BenchmarkLookup");
    manager.RegisterCategory(category, u"Lookup", false, false);
    std::vector<PropertyKey> result;
    for (int i = 0; i < kKeysPerCategory; ++i) {
      result.emplace_back(u"property" + std::u16string(1, char16_t(u'A' + i)));
      manager.RegisterProperty(category, result.back(),
                               new Styles::StyleProperty(Any(0.0), nullptr, &IsNumber));
    }
    return result;
  }();
  return keys;
}

// Chains of depth+1 styles; the looked-up key lives only in each root.
struct Chains {
  Chains(int chainCount, int depth) {
    const std::vector<PropertyKey>& keys = Keys();
    target = keys[0];
    std::mt19937 random(42);
    for (int c = 0; c < chainCount; ++c) {
      Style* parent = nullptr;
      for (int level = 0; level <= depth; ++level) {
        styles.emplace_back(new Style(parent, PropertyKey(u"BenchmarkLookup")));
        Style* style = styles.back().get();
        if (level == 0)
          style->SetProperty(target, Any(double(c)));
        // Other keys fill the own values so that each search has work to do.
        for (int k = 1; k <= kOwnValuesPerStyle - (level == 0 ? 1 : 0); ++k)
          style->SetProperty(keys[std::size_t(k)], Any(double(k)));
        parent = style;
      }
      leaves.push_back(parent);
    }
    std::shuffle(leaves.begin(), leaves.end(), random);
  }
  PropertyKey target;
  std::vector<std::unique_ptr<Style>> styles;
  std::vector<Style*> leaves;
};

// Times `lookup` over the leaves in turn.
template <class Leaf, class Lookup>
void RunLookups(benchmark::State& state, const std::vector<Leaf>& leaves, Lookup lookup) {
  std::size_t i = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(lookup(leaves[i]));
    i = (i + 1) % leaves.size();
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_GetPropertyOwnHit(benchmark::State& state) {
  const Chains chains(int(state.range(0)), 0);
  RunLookups(state, chains.leaves,
             [&](const Style* leaf) { return &leaf->GetProperty(chains.target); });
}
BENCHMARK(BM_GetPropertyOwnHit)->Arg(8192);

void BM_GetPropertyParentMiss(benchmark::State& state) {
  const int depth = int(state.range(0));
  const Chains chains(65536 / (depth + 1), depth);
  RunLookups(state, chains.leaves,
             [&](const Style* leaf) { return &leaf->GetProperty(chains.target); });
  state.SetLabel("depth " + std::to_string(depth));
}
BENCHMARK(BM_GetPropertyParentMiss)->Arg(1)->Arg(4)->Arg(16);

// The same walk over node-based maps holding the same values, for comparison.
struct NodeStyle {
  std::map<PropertyKey, Any> values;
  const NodeStyle* parent = nullptr;
};

// A node for `style` and its ancestors, filed in `nodes`.
const NodeStyle* Mirror(const Style* style, std::vector<std::unique_ptr<NodeStyle>>& nodes) {
  if (!style)
    return nullptr;
  const NodeStyle* parent = Mirror(style->GetParent(), nodes);
  nodes.emplace_back(new NodeStyle);
  nodes.back()->parent = parent;
  for (const Styles::PropertyMap::ConstEntry& entry : style->GetProperties())
    nodes.back()->values.emplace(entry.first, entry.second);
  return nodes.back().get();
}

void BM_NodeMapParentMiss(benchmark::State& state) {
  const int depth = int(state.range(0));
  std::vector<std::unique_ptr<NodeStyle>> nodes;
  std::vector<const NodeStyle*> leaves;
  PropertyKey target;
  {
    const Chains chains(65536 / (depth + 1), depth);
    target = chains.target;
    for (const Style* leaf : chains.leaves)
      leaves.push_back(Mirror(leaf, nodes));
  }
  RunLookups(state, leaves, [&](const NodeStyle* leaf) {
    for (const NodeStyle* node = leaf; node; node = node->parent) {
      const auto entry = node->values.find(target);
      if (entry != node->values.end())
        return &entry->second;
    }
    return static_cast<const Any*>(nullptr);
  });
  state.SetLabel("depth " + std::to_string(depth));
}
BENCHMARK(BM_NodeMapParentMiss)->Arg(1)->Arg(4)->Arg(16);

} // namespace
