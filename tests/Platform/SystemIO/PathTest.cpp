#include <SystemIO/Path.h>

#include <gtest/gtest.h>

namespace {

TEST(PathTest, Combine) {
  struct Case {
    const char16_t* folder;
    const char16_t* name;
    const char16_t* expected;
  };
  const Case cases[] = {
      {u"/presets", u"Set.qsty", u"/presets/Set.qsty"},
      {u"/presets/", u"Set.qsty", u"/presets/Set.qsty"},
      {u"", u"Set.qsty", u"Set.qsty"},
      {u"/presets", u"/other/Set.qsty", u"/other/Set.qsty"},
      {u"/presets", u"", u"/presets"},
      {u"rel", u"sub/x", u"rel/sub/x"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::PrintToString(std::u16string(c.folder)) + " + " +
                 ::testing::PrintToString(std::u16string(c.name)));
    EXPECT_EQ(SystemIO::Path::Combine(c.folder, c.name), c.expected);
  }
}

} // namespace
