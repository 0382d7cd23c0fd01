#include <ZelUtils/Any.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <typeinfo>
#include <vector>

namespace {

using ZelUtils::Any;
using Text = ZelStringT<char16_t>;

struct Node {};
struct NoEquality {};
// Compares like a JSON object: equality but no ordering.
struct JsonLike {
  std::vector<int> members;
  friend bool operator==(const JsonLike& a, const JsonLike& b) { return a.members == b.members; }
};
enum class Color : int { Red = 1, Blue = 7 };

// Larger than the inline buffer, so Any keeps it on the heap; counts live
// instances to catch leaks and double destruction.
struct Counted {
  static int live;
  double payload[5] = {1, 2, 3, 4, 5};
  Counted() { ++live; }
  Counted(const Counted& other) : Counted() { std::copy_n(other.payload, 5, payload); }
  ~Counted() { --live; }
  Counted& operator=(const Counted&) = default;
  friend bool operator==(const Counted& a, const Counted& b) {
    return std::equal(a.payload, a.payload + 5, b.payload);
  }
};
int Counted::live = 0;

TEST(AnyTest, EqualityNeedsSameKindAndValue) {
  struct Case {
    const char* name;
    Any a, b;
    bool equal;
  };
  Node node;
  const Case cases[] = {
      {"empty", Any(), Any(), true},
      {"empty vs double", Any(), Any(0.0), false},
      {"double vs text", Any(1.0), Any(u"1"), false},
      {"literal vs text", Any(u"abc"), Any(Text(u"abc")), true},
      {"Node* vs const Node*", Any(&node), Any(static_cast<const Node*>(&node)), false},
      {"JSON-like", Any(JsonLike{{1, 2}}), Any(JsonLike{{1, 2}}), true},
      {"no equality of its own", Any(NoEquality{}), Any(NoEquality{}), false},
      {"vector of such", Any(std::vector<NoEquality>(1)), Any(std::vector<NoEquality>(1)), false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(c.a == c.b, c.equal);
    EXPECT_EQ(c.b == c.a, c.equal);
  }
}

TEST(AnyTest, MixedKindsSortIntoKindGroups) {
  Node nodes[2];
  std::vector<Any> values = {
      Any(3.0),  Any(u"b"),      Any(),      Any(1.0),        Any(&nodes[1]),   Any(u"a"),
      Any(true), Any(&nodes[0]), Any(false), Any(JsonLike{}), Any(Color::Blue), Any(Color::Red)};
  std::sort(values.begin(), values.end());
  EXPECT_TRUE(values[0].IsEmpty());
  // Each of the 7 kinds forms one run, sorted by the kind's own order.
  std::size_t runs = 1;
  for (std::size_t i = 1; i < values.size(); ++i) {
    SCOPED_TRACE(i);
    if (values[i].Type() != values[i - 1].Type())
      ++runs;
    else
      EXPECT_FALSE(values[i] < values[i - 1]);
  }
  EXPECT_EQ(runs, 7u);
  EXPECT_NE(Any(1.0) < Any(u"1"), Any(u"1") < Any(1.0)); // one direction across kinds
  // A kind without an ordering is never less, whatever the contents.
  EXPECT_FALSE(Any(JsonLike{{1}}) < Any(JsonLike{{2}}));
  EXPECT_FALSE(Any(JsonLike{{2}}) < Any(JsonLike{{1}}));
}

TEST(AnyTest, CopiesDeeplyAndFreesOnce) {
  {
    Any original = Counted();
    Any copy = original;
    EXPECT_EQ(Counted::live, 2);
    copy.Get<Counted>().payload[0] = 42;
    EXPECT_FALSE(copy == original);
    Any moved = std::move(copy);
    EXPECT_EQ(moved.Get<Counted>().payload[0], 42);
    copy = original; // a moved-from value can be assigned again
    moved = original;
    EXPECT_TRUE(moved == original);
    moved = moved; // self-assignment keeps the heap value
    moved = 3.0;   // another kind replaces it
    EXPECT_EQ(Counted::live, 2);
    original = original.Get<Counted>(); // same kind, assigned from itself in place
    EXPECT_EQ(original.Get<Counted>().payload[4], 5);
  }
  EXPECT_EQ(Counted::live, 0);
}

TEST(AnyTest, GetDemandsTheExactKind) {
  Node node;
  const Any mutablePointer = &node;
  const Any constPointer = static_cast<const Node*>(&node);
  EXPECT_TRUE(mutablePointer.IsTypeCompatible<const Node*>());
  EXPECT_FALSE(constPointer.IsTypeCompatible<Node*>());
  EXPECT_EQ(mutablePointer.Get<Node*>(), &node);
  EXPECT_THROW(mutablePointer.Get<const Node*>(), std::bad_cast);
  EXPECT_THROW(constPointer.Get<Node*>(), std::bad_cast);
  EXPECT_THROW(Any().Get<double>(), std::bad_cast);
  EXPECT_THROW(Any(1.0).Get<float>(), std::bad_cast);
  // A UTF-16 literal is held as text, not as a pointer.
  EXPECT_TRUE(Any(u"text").IsTypeCompatible<Text>());
  EXPECT_FALSE(Any(u"text").IsTypeCompatible<const char16_t*>());

  EXPECT_EQ(Any(Color::Blue).GetEnumAsInt(), 7);
  EXPECT_FALSE(Any(7.0).HasEnum() || Any().HasEnum());
}

} // namespace
