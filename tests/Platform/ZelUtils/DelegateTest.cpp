#include <ZelUtils/Delegate.h>

#include <ZelPlatform/ZelString.h>

#include <gtest/gtest.h>

#include <functional>

namespace {

struct Node {};

TEST(DelegateTest, WrapsAnyCallable) {
  using Visitor = ZelUtils::PortableVersion::Delegate<bool(const ZelStringT<char16_t>&)>;
  int calls = 0;
  const Visitor counting = [&calls](const ZelStringT<char16_t>& name) {
    ++calls;
    return name == u"stop";
  };
  EXPECT_FALSE(counting(u"go"));
  EXPECT_TRUE(counting(u"stop"));
  const Visitor copy = counting; // copies share the captured state by reference
  copy(u"x");
  EXPECT_EQ(calls, 3);

  bool (*function)(Node*) = [](Node* node) { return node != nullptr; };
  const ZelUtils::PortableVersion::Delegate<bool(Node*)> fromPointer = function;
  EXPECT_TRUE(static_cast<bool>(fromPointer));
  EXPECT_FALSE(fromPointer(nullptr));

  const ZelUtils::PortableVersion::Delegate<bool(Node*)> empty;
  EXPECT_FALSE(static_cast<bool>(empty));
  EXPECT_THROW(empty(nullptr), std::bad_function_call);
}

} // namespace
