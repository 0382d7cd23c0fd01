#include <Internal/MemberPositions.h>

#include <Internal/ToolsSupport.h>

#include <algorithm>
#include <string>
#include <tuple>
#include <unordered_map>

namespace Styles {
namespace Tools {
namespace detail {

namespace {

using Text = ZelStringT<char16_t>;

bool IsSpace(char16_t c) { return c == u' ' || c == u'\t' || c == u'\n' || c == u'\r'; }

int HexValue(char16_t c) {
  if (c >= u'0' && c <= u'9')
    return c - u'0';
  if (c >= u'a' && c <= u'f')
    return c - u'a' + 10;
  if (c >= u'A' && c <= u'F')
    return c - u'A' + 10;
  return -1;
}

// Reads the string whose opening quote is at `i` and leaves `i` after its
// closing quote; with `decoded`, its escapes resolved.
void ReadString(std::u16string_view text, std::size_t& i, std::u16string* decoded) {
  for (++i; i < text.size(); ++i) {
    char16_t c = text[i];
    if (c == u'"') {
      ++i;
      return;
    }
    if (c == u'\\' && i + 1 < text.size()) {
      c = text[++i];
      if (c == u'u' && i + 4 < text.size()) {
        int value = 0;
        for (std::size_t k = 1; k <= 4; ++k)
          value = value * 16 + std::max(HexValue(text[i + k]), 0);
        c = static_cast<char16_t>(value);
        i += 4;
      } else {
        static constexpr char16_t kFrom[] = u"bfnrt";
        static constexpr char16_t kTo[] = u"\b\f\n\r\t";
        const char16_t* found = std::char_traits<char16_t>::find(kFrom, 5, c);
        if (found)
          c = kTo[found - kFrom];
      }
    }
    if (decoded)
      decoded->push_back(c);
  }
}

} // namespace

std::vector<std::pair<int, int>> LinesAndColumns(const Text& text,
                                                 const std::vector<std::size_t>& offsets) {
  std::vector<std::pair<int, int>> positions;
  positions.reserve(offsets.size());
  int line = 1, column = 1;
  std::size_t i = 0;
  for (const std::size_t offset : offsets) {
    for (const std::size_t end = std::min(offset, text.GetLength()); i < end; ++i) {
      const char16_t c = text[i];
      if (c == u'\n') {
        ++line;
        column = 1;
      } else if (c < 0xDC00 || c > 0xDFFF || i == 0 || text[i - 1] < 0xD800 ||
                 text[i - 1] > 0xDBFF) {
        ++column; // the second half of a surrogate pair is not a character of its own
      }
    }
    positions.emplace_back(line, column);
  }
  return positions;
}

void LocateMembers(const Text& text, std::vector<Diagnostic>& diagnostics) {
  // The pointers wanted, each with the offsets where it occurs.
  std::unordered_map<std::u16string, std::vector<std::size_t>> wanted;
  for (const Diagnostic& d : diagnostics)
    if (d.line == 0 && !d.pointer.IsEmpty())
      wanted.emplace(d.pointer.GetStdString(), std::vector<std::size_t>());
  if (wanted.empty())
    return;

  // The pointer of the value being read is kept as text; each open container
  // remembers its own pointer's length and, for an array, the element count.
  struct Container {
    bool object;
    std::size_t base;
    std::size_t index;
  };
  const std::u16string_view view = text.GetView();
  std::vector<Container> open;
  std::u16string pointer, key;
  bool expectKey = false, expectElement = false;
  const auto record = [&](std::size_t offset) {
    const auto found = wanted.find(pointer);
    if (found != wanted.end())
      found->second.push_back(offset);
  };
  for (std::size_t i = 0; i < view.size();) {
    const char16_t c = view[i];
    if (IsSpace(c)) {
      ++i;
      continue;
    }
    if (expectElement && c != u']') {
      pointer.resize(open.back().base);
      const std::string index = std::to_string(open.back().index);
      pointer += u'/';
      pointer.append(index.begin(), index.end());
      record(i);
      expectElement = false;
    }
    if (c == u'"') {
      const std::size_t start = i;
      key.clear();
      ReadString(view, i, expectKey ? &key : nullptr);
      if (expectKey) {
        pointer.resize(open.back().base);
        detail::AppendPointerToken(pointer, key);
        record(start);
        expectKey = false;
      }
      continue;
    }
    if (c == u'{' || c == u'[') {
      open.push_back(Container{c == u'{', pointer.size(), 0});
      expectKey = c == u'{';
      expectElement = c == u'[';
    } else if ((c == u'}' || c == u']') && !open.empty()) {
      pointer.resize(open.back().base);
      open.pop_back();
      expectKey = expectElement = false;
    } else if (c == u',' && !open.empty()) {
      expectKey = open.back().object;
      expectElement = !open.back().object;
      open.back().index += expectElement ? 1 : 0;
    }
    ++i;
  }

  // A diagnostic of a repetition takes the next later occurrence of its name.
  std::unordered_map<std::u16string, std::size_t> repetitions;
  std::vector<std::pair<std::size_t, std::size_t>> located; // offset, diagnostic
  for (std::size_t d = 0; d < diagnostics.size(); ++d) {
    if (diagnostics[d].line != 0 || diagnostics[d].pointer.IsEmpty())
      continue;
    const std::u16string& name = diagnostics[d].pointer.GetStdString();
    const std::vector<std::size_t>& offsets = wanted[name];
    if (offsets.empty())
      continue;
    const bool repeated = diagnostics[d].code == "duplicate-member" ||
                          diagnostics[d].code == "duplicate-name";
    const std::size_t occurrence = repeated ? ++repetitions[name] : 0;
    located.emplace_back(offsets[std::min(occurrence, offsets.size() - 1)], d);
  }
  std::sort(located.begin(), located.end());
  std::vector<std::size_t> offsets;
  for (const auto& entry : located)
    offsets.push_back(entry.first);
  const std::vector<std::pair<int, int>> positions = LinesAndColumns(text, offsets);
  for (std::size_t k = 0; k < located.size(); ++k)
    std::tie(diagnostics[located[k].second].line, diagnostics[located[k].second].column) =
        positions[k];
}

} // namespace detail
} // namespace Tools
} // namespace Styles
