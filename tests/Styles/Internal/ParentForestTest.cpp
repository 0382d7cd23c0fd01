#include <Styles/Internal/ParentForest.h>

#include <Styles/Style.h>

#include <gtest/gtest.h>

#include <random>
#include <vector>

namespace Styles {
namespace {

// Random links offered over styles that already have chains of parents, each
// answered as a walk up from the new parent says and kept only when accepted,
// as an import does; a refused link must leave the child's old one in place.
TEST(ParentForestTest, RefusesExactlyTheLinksAParentWalkRefuses) {
  std::mt19937 random(7);
  for (int round = 0; round < 200; ++round) {
    SCOPED_TRACE(::testing::Message() << "round " << round);
    std::vector<Style> styles(2 + random() % 40);
    for (std::size_t i = 1; i < styles.size(); ++i)
      if (random() % 2)
        styles[i].SetParent(&styles[random() % i]);
    detail::ParentForest forest;
    for (int step = 0; step < 60; ++step) {
      Style& child = styles[random() % styles.size()];
      Style& parent = styles[random() % styles.size()];
      bool closesCycle = false;
      for (const Style* up = &parent; up && !closesCycle; up = up->GetParent())
        closesCycle = up == &child;
      ASSERT_EQ(forest.Link(&child, &parent), !closesCycle);
      if (!closesCycle)
        child.SetParent(&parent);
    }
  }
}

} // namespace
} // namespace Styles
