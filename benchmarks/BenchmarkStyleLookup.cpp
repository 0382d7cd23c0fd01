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

void BM_GetPropertyOwnHit(benchmark::State& state) {
  Chains chains(int(state.range(0)), 0);
  std::size_t i = 0;
  for (auto _ : state) {
    const Any& value = chains.leaves[i]->GetProperty(chains.target);
    benchmark::DoNotOptimize(&value);
    i = (i + 1) % chains.leaves.size();
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_GetPropertyOwnHit)->Arg(8192);

void BM_GetPropertyParentMiss(benchmark::State& state) {
  const int depth = int(state.range(0));
  Chains chains(65536 / (depth + 1), depth);
  std::size_t i = 0;
  for (auto _ : state) {
    const Any& value = chains.leaves[i]->GetProperty(chains.target);
    benchmark::DoNotOptimize(&value);
    i = (i + 1) % chains.leaves.size();
  }
  state.SetItemsProcessed(state.iterations());
  state.SetLabel("depth " + std::to_string(depth));
}
BENCHMARK(BM_GetPropertyParentMiss)->Arg(1)->Arg(4)->Arg(16);

// The same walk over node-based maps, for comparison.
struct NodeStyle {
  std::map<PropertyKey, Any> values;
  const NodeStyle* parent = nullptr;
};

void BM_NodeMapParentMiss(benchmark::State& state) {
  const int depth = int(state.range(0));
  const std::vector<PropertyKey>& keys = Keys();
  const int chainCount = 65536 / (depth + 1);
  std::vector<std::unique_ptr<NodeStyle>> styles;
  std::vector<const NodeStyle*> leaves;
  for (int c = 0; c < chainCount; ++c) {
    const NodeStyle* parent = nullptr;
    for (int level = 0; level <= depth; ++level) {
      styles.emplace_back(new NodeStyle);
      NodeStyle* style = styles.back().get();
      style->parent = parent;
      if (level == 0)
        style->values.emplace(keys[0], Any(double(c)));
      for (int k = 1; k <= kOwnValuesPerStyle - (level == 0 ? 1 : 0); ++k)
        style->values.emplace(keys[std::size_t(k)], Any(double(k)));
      parent = style;
    }
    leaves.push_back(parent);
  }
  std::shuffle(leaves.begin(), leaves.end(), std::mt19937(42));
  std::size_t i = 0;
  for (auto _ : state) {
    const Any* found = nullptr;
    for (const NodeStyle* style = leaves[i]; style && !found; style = style->parent) {
      const auto entry = style->values.find(keys[0]);
      if (entry != style->values.end())
        found = &entry->second;
    }
    benchmark::DoNotOptimize(found);
    i = (i + 1) % leaves.size();
  }
  state.SetItemsProcessed(state.iterations());
  state.SetLabel("depth " + std::to_string(depth));
}
BENCHMARK(BM_NodeMapParentMiss)->Arg(1)->Arg(4)->Arg(16);

} // namespace
