#include <Styles/Internal/StyleIndex.h>

#include <Styles/Style.h>

#include <gtest/gtest.h>

#include <map>
#include <random>
#include <string>
#include <vector>

namespace Styles {
namespace {

// Random filing, replacing, re-spelling and erasing, checked after every step
// against a map from folded name to style; the letters' foldings collide
// ("ß" folds to "ss").
TEST(StyleIndexTest, MatchesSortedFoldedNames) {
  std::mt19937 random(19);
  const std::u16string letters = u"sS\u00df\u00c4\u00e4b";
  std::vector<Style> styles(96);
  detail::StyleIndex index;
  std::map<std::u16string, Style*> model;
  for (int step = 0; step < 4000; ++step) {
    SCOPED_TRACE(::testing::Message() << "step " << step);
    std::u16string name, folded;
    for (std::size_t n = 1 + random() % 3; n > 0; --n)
      name += letters[random() % letters.size()];
    ZelPlatform::detail::FoldCaseUtf16(name, folded);
    Style* style = &styles[random() % styles.size()];
    detail::StyleIndex::Entry* found = index.Find(name);
    const unsigned operation = random() % 4;
    if (operation == 0 && found) {
      index.Erase(found);
      model.erase(folded);
    } else if (operation == 1 && found) {
      index.Replace(found, name, found->style);
      EXPECT_EQ(found->Name(), name);
    } else if (!index.Find(style)) {
      const bool replace = random() % 2;
      Style* previous = nullptr;
      const auto [entry, filed] = index.File(name, style, replace, previous);
      Style*& holder = model[folded];
      EXPECT_EQ(filed, replace || !holder);
      EXPECT_EQ(previous, filed ? holder : nullptr);
      holder = filed ? style : holder;
      EXPECT_EQ(entry->style, holder);
    }
    ASSERT_EQ(index.Size(), model.size());
    ASSERT_EQ(index.Ordered().size(), model.size());
    auto expected = model.begin();
    for (const detail::StyleIndex::Entry* entry : index.Ordered()) {
      EXPECT_EQ(entry->Folded(), expected->first);
      EXPECT_EQ((expected++)->second, entry->style);
      EXPECT_EQ(index.Find(entry->style), entry);
    }
  }
}

} // namespace
} // namespace Styles
