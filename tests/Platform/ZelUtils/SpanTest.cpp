#include <ZelUtils/Span.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <string>
#include <vector>

namespace {

using ZelUtils::maybe_sorted_span;

struct Node {};

TEST(SpanTest, ContainsSearchesAsTheFlagSays) {
  struct Case {
    std::vector<int> values;
    bool sorted;
    int probe;
    bool expected;
  };
  const Case cases[] = {
      {{}, true, 1, false},        {{}, false, 1, false},
      {{1, 3, 5}, true, 3, true},  {{1, 3, 5}, true, 4, false},
      {{1, 3, 5}, true, 6, false}, {{1, 3, 5}, true, 0, false},
      {{5, 1, 3}, false, 1, true}, {{5, 1, 3}, false, 4, false},
      {{5, 1, 3}, true, 1, false}, // a wrong flag makes binary search miss
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::PrintToString(c.values) + " probe " + std::to_string(c.probe));
    const maybe_sorted_span<const int> span(c.values, c.sorted);
    EXPECT_EQ(span.size(), c.values.size());
    EXPECT_EQ(span.is_sorted(), c.sorted);
    EXPECT_EQ(span.contains(c.probe), c.expected);
  }
}

TEST(SpanTest, ViewsVectorsAndPointerRanges) {
  Node nodes[3];
  std::vector<Node*> pointers = {&nodes[0], &nodes[1], &nodes[2]};
  std::sort(pointers.begin(), pointers.end(), std::less<void>());
  const std::vector<Node*>& constPointers = pointers;

  const maybe_sorted_span<Node* const, std::less<void>> fromConst(constPointers, true);
  const maybe_sorted_span<Node* const> fromRange(pointers.data(), pointers.data() + 2, true);
  maybe_sorted_span<Node*> mutableSpan(pointers, true);
  EXPECT_EQ(fromConst.data(), pointers.data());
  EXPECT_EQ(fromRange.size(), 2u);
  EXPECT_TRUE(fromConst.contains(static_cast<const Node*>(pointers[2])));
  EXPECT_FALSE(fromRange.contains(pointers[2]));

  mutableSpan[0] = nullptr; // a span of mutable elements writes through
  EXPECT_EQ(pointers[0], nullptr);
  EXPECT_TRUE(maybe_sorted_span<int>().empty());
}

} // namespace
