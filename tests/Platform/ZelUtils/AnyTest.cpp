#include <ZelUtils/Any.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <typeinfo>
#include <vector>

namespace {

using ZelUtils::Any;
using Text = ZelStringT<char16_t>;

struct Node {};

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

struct NoEquality {
  int value = 0;
};

// Compares like a JSON object: equality but no ordering.
struct JsonLike {
  std::vector<int> members;
  friend bool operator==(const JsonLike& a, const JsonLike& b) { return a.members == b.members; }
};

enum class Color : int { Red = 1, Blue = 7 };

TEST(AnyTest, EqualityNeedsSameKindAndValue) {
  struct Case {
    const char* name;
    Any a;
    Any b;
    bool equal;
  };
  Node node;
  const Case cases[] = {
      {"empty vs empty", Any(), Any(), true},
      {"empty vs double", Any(), Any(0.0), false},
      {"double vs text", Any(1.0), Any(u"1"), false},
      {"double vs int", Any(1.0), Any(1), false},
      {"doubles", Any(2.5), Any(2.5), true},
      {"texts differ in case", Any(u"a"), Any(u"A"), false},
      {"texts", Any(u"abc"), Any(Text(u"abc")), true},
      {"Node* vs const Node*", Any(&node), Any(static_cast<const Node*>(&node)), false},
      {"pointer vectors", Any(std::vector<Node*>{&node}), Any(std::vector<Node*>{&node}), true},
      {"JSON-like", Any(JsonLike{{1, 2}}), Any(JsonLike{{1, 2}}), true},
      {"no equality of its own", Any(NoEquality{}), Any(NoEquality{}), false},
      {"vectors of a kind without equality", Any(std::vector<NoEquality>(1)),
       Any(std::vector<NoEquality>(1)), false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(c.a == c.b, c.equal);
    EXPECT_EQ(c.b == c.a, c.equal);
    EXPECT_EQ(c.a != c.b, !c.equal);
  }
  const Any noEquality = NoEquality{};
  EXPECT_FALSE(noEquality == noEquality);
}

TEST(AnyTest, MixedKindsSortIntoKindGroups) {
  Node nodes[2];
  std::vector<Any> values = {Any(3.0),           Any(u"b"),        Any(),           Any(1.0),
                             Any(&nodes[1]),     Any(u"a"),        Any(true),       Any(),
                             Any(&nodes[0]),     Any(false),       Any(JsonLike{}), Any(2.0),
                             Any(JsonLike{{1}}), Any(Color::Blue), Any(Color::Red)};
  std::sort(values.begin(), values.end());

  EXPECT_TRUE(values[0].IsEmpty());
  EXPECT_TRUE(values[1].IsEmpty());
  // Each kind forms one run, sorted by the kind's own order.
  std::vector<const std::type_info*> runs;
  for (std::size_t i = 0; i < values.size(); ++i) {
    if (i > 0 && values[i].Type() == values[i - 1].Type()) {
      EXPECT_FALSE(values[i] < values[i - 1]) << i;
      continue;
    }
    for (const std::type_info* seen : runs)
      EXPECT_FALSE(*seen == values[i].Type()) << "kind split at " << i;
    runs.push_back(&values[i].Type());
  }
  EXPECT_EQ(runs.size(), 7u);

  // Across kinds exactly one direction holds, the same every time.
  const Any number = 1.0;
  const Any text = u"1";
  EXPECT_NE(number < text, text < number);
  EXPECT_FALSE(Any() < Any());

  // A kind without an ordering is never less, whatever the contents.
  EXPECT_FALSE(Any(JsonLike{{1}}) < Any(JsonLike{{2}}));
  EXPECT_FALSE(Any(JsonLike{{2}}) < Any(JsonLike{{1}}));
}

TEST(AnyTest, CopiesDeeplyAndMovesWithoutLeaks) {
  {
    Any original = Counted();
    EXPECT_EQ(Counted::live, 1);
    Any copy = original;
    EXPECT_EQ(Counted::live, 2);
    copy.Get<Counted>().payload[0] = 42;
    EXPECT_EQ(original.Get<Counted>().payload[0], 1);
    EXPECT_FALSE(copy == original);

    Any moved = std::move(copy);
    EXPECT_EQ(Counted::live, 2);
    EXPECT_EQ(moved.Get<Counted>().payload[0], 42);
    copy = original; // a moved-from value can be assigned again
    EXPECT_TRUE(copy == original);

    moved = original; // copy assignment over a held heap value
    EXPECT_TRUE(moved == original);
    moved = 3.0; // another kind replaces the heap value
    EXPECT_EQ(Counted::live, 2);
    original = std::move(moved);
    EXPECT_EQ(Counted::live, 1);
  }
  EXPECT_EQ(Counted::live, 0);

  // A vector of pointers copies the pointers, never what they point to.
  Node nodes[2];
  const Any vector = std::vector<Node*>{&nodes[0], &nodes[1]};
  Any copy = vector;
  EXPECT_NE(&copy.Get<std::vector<Node*>>(), &vector.Get<std::vector<Node*>>());
  EXPECT_EQ(copy.Get<std::vector<Node*>>()[1], &nodes[1]);
}

TEST(AnyTest, SelfAssignmentKeepsTheValue) {
  Any value = Counted();
  value.Get<Counted>().payload[1] = 9;
  Any& alias = value;
  value = alias;
  EXPECT_EQ(value.Get<Counted>().payload[1], 9);
  value = std::move(alias);
  EXPECT_EQ(value.Get<Counted>().payload[1], 9);
  value = value.Get<Counted>(); // same kind, assigned from itself in place
  EXPECT_EQ(value.Get<Counted>().payload[1], 9);

  Any text = u"keep";
  text = text.Get<Text>();
  EXPECT_TRUE(text.Get<Text>() == u"keep");
  EXPECT_EQ(Counted::live, 1);
}

TEST(AnyTest, AssignmentReplacesOrUpdatesTheKind) {
  Any value = 1.0;
  const double* held = &value.Get<double>();
  value = 2.0;
  EXPECT_EQ(&value.Get<double>(), held); // same kind: assigned in place
  EXPECT_EQ(value.Get<double>(), 2.0);

  value = u"text"; // a UTF-16 literal is text, not a pointer
  EXPECT_TRUE(value.IsTypeCompatible<Text>());
  EXPECT_TRUE(value.Get<Text>() == u"text");
  EXPECT_FALSE(value.IsTypeCompatible<const char16_t*>());

  value = Any();
  EXPECT_TRUE(value.IsEmpty());
  EXPECT_TRUE(value.Type() == typeid(void));
}

TEST(AnyTest, GetDemandsTheExactKind) {
  Node node;
  const Any mutablePointer = &node;
  const Any constPointer = static_cast<const Node*>(&node);

  EXPECT_TRUE(mutablePointer.IsTypeCompatible<Node*>());
  EXPECT_TRUE(mutablePointer.IsTypeCompatible<const Node*>());
  EXPECT_TRUE(constPointer.IsTypeCompatible<const Node*>());
  EXPECT_FALSE(constPointer.IsTypeCompatible<Node*>());
  EXPECT_FALSE(Any().IsTypeCompatible<Node*>());

  EXPECT_EQ(mutablePointer.Get<Node*>(), &node);
  EXPECT_THROW(mutablePointer.Get<const Node*>(), std::bad_cast);
  EXPECT_THROW(constPointer.Get<Node*>(), std::bad_cast);
  EXPECT_THROW(Any().Get<double>(), std::bad_cast);
  EXPECT_THROW(Any(1.0).Get<float>(), std::bad_cast);
  EXPECT_THROW(Any(1.0).Get<Text>(), std::bad_cast);
  EXPECT_EQ(Any(1.0).GetIf<int>(), nullptr);
}

TEST(AnyTest, ReportsEnumerations) {
  const Any color = Color::Blue;
  EXPECT_TRUE(color.HasEnum());
  EXPECT_EQ(color.GetEnumAsInt(), 7);
  EXPECT_TRUE(Any(Color::Red) < color);
  for (const Any& other : {Any(), Any(7.0), Any(true), Any(u"7")}) {
    EXPECT_FALSE(other.HasEnum());
    EXPECT_EQ(other.GetEnumAsInt(), 0);
  }
}

} // namespace
