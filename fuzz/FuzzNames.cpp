// The name helpers on UTF-16 input (unpaired surrogates included): SplitPath
// gives back the text's pieces, ConvertToValidStyleName is idempotent and
// keeps only what its mode allows, and LessThanCaseInsensitive is a strict
// weak order whose equivalence is CompareNoCase == 0.
#include "FuzzCheck.h"

#include <Styles/StyleUtilities.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/String.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <string>
#include <utility>

using Text = ZelStringT<char16_t>;

namespace {

int Sign(int value) { return (value > 0) - (value < 0); }

void CheckOrder(const Text& a, const Text& b, const Text& c) {
  const ZelUtils::String::LessThanCaseInsensitive less;
  for (const auto& [x, y] : {std::pair<const Text&, const Text&>{a, b}, {b, c}, {a, c}}) {
    const int compared = x.CompareNoCase(y);
    FUZZ_CHECK(Sign(compared) == -Sign(y.CompareNoCase(x)));
    FUZZ_CHECK(less(x, y) == (compared < 0));
    FUZZ_CHECK(!(less(x, y) && less(y, x)));
    FUZZ_CHECK((!less(x, y) && !less(y, x)) == (compared == 0));
  }
  FUZZ_CHECK(a.CompareNoCase(a) == 0);
  // Transitivity of the order and of its equivalence.
  if (less(a, b) && less(b, c))
    FUZZ_CHECK(less(a, c));
  if (a.CompareNoCase(b) == 0 && b.CompareNoCase(c) == 0)
    FUZZ_CHECK(a.CompareNoCase(c) == 0);
  if (a.CompareNoCase(b) == 0)
    FUZZ_CHECK(Sign(a.CompareNoCase(c)) == Sign(b.CompareNoCase(c)));
}

void CheckValidName(const Text& name) {
  for (const bool strict : {true, false}) {
    const Text valid = Styles::ConvertToValidStyleName(name, strict);
    FUZZ_CHECK(Styles::ConvertToValidStyleName(valid, strict) == valid);
    FUZZ_CHECK(Text(valid).Trim() == valid);
    for (const char16_t unit : valid) {
      FUZZ_CHECK(unit != u'\t' && unit != u'\n' && unit != u'"' && unit != u'~');
      if (strict)
        FUZZ_CHECK(unit >= u' ' && unit < 0x7F && unit != u'\\' && unit != u'<' && unit != u'>');
    }
  }
}

// SplitPath interns every piece for good, so it gets a short text over a
// small alphabet: the pool stays bounded however long the run.
void CheckSplitPath(const std::u16string& units) {
  static constexpr char16_t kAlphabet[] = {u'a', u'.', u' ', u'A', 0xD800, 0xDC00};
  std::u16string path;
  for (std::size_t i = 0; i < units.size() && i < 6; ++i)
    path += kAlphabet[units[i] % std::size(kAlphabet)];
  const Styles::PropertyPath keys = Styles::SplitPath(Text(path));
  std::u16string joined;
  for (std::size_t i = 0; i < keys.size(); ++i)
    joined += (i ? u"." : u"") + keys[i].GetString().GetStdString();
  FUZZ_CHECK(joined == path);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::u16string units(size / 2, u'\0');
  std::memcpy(units.data(), data, units.size() * 2);
  const std::size_t third = units.size() / 3;
  const Text a(units.substr(0, third)), b(units.substr(third, third)), c(units.substr(2 * third));
  CheckOrder(a, b, c);
  CheckOrder(c, a, b);
  CheckValidName(Text(units));
  CheckSplitPath(units);
  return 0;
}
