#include <ZelUtils/Variant.h>

#include <ZelPlatform/ZelString.h>

#include <gtest/gtest.h>

#include <cstddef>
#include <typeinfo>

namespace {

TEST(VariantTest, ChecksTheHeldKind) {
  using Value = ZelUtils::Variant<std::nullptr_t, double, ZelStringT<char16_t>>;
  Value value = 2.0;
  EXPECT_TRUE(value.Is<double>());
  EXPECT_EQ(value.Get<double>(), 2.0);
  EXPECT_THROW(value.Get<ZelStringT<char16_t>>(), std::bad_cast);
  EXPECT_EQ(value.GetIf<std::nullptr_t>(), nullptr);

  value.Emplace<ZelStringT<char16_t>>(u"text");
  EXPECT_EQ(value.Index(), 2u);
  EXPECT_TRUE(value == Value(ZelStringT<char16_t>(u"text")));
  EXPECT_FALSE(value == Value(2.0));
  EXPECT_TRUE(Value().Is<std::nullptr_t>());
}

} // namespace
