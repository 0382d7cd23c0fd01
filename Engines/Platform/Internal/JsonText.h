// The output side of JSON text: a growing buffer of UTF-16 units and the
// compact layout written straight into it. Json::Writer and ValueToString
// write through these. Not installed: hosts never include it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#if defined(__SSE2__)
#include <emmintrin.h>
#endif
#include <string>
#include <vector>

namespace Json {
namespace detail {

// Text that grows into a standard string, which is sized up a block at a time
// just ahead of the writing (a string's resize fills with zeros, cheap while
// the block is fresh in cache) and handed out whole at the end, never copied.
// Put/PutUnsafe/Reserve/Flush are what an output stream of the JSON library
// offers; Claim and Commit let a writer store units directly.
class TextOutput {
public:
  using Ch = char16_t;
  void Put(Ch c) {
    if (m_size == m_capacity)
      Grow(1);
    m_units[m_size++] = c;
  }
  void PutUnsafe(Ch c) { m_units[m_size++] = c; }
  void Reserve(std::size_t count) {
    if (count > m_capacity - m_size)
      Grow(count);
  }
  void Flush() {}
  // Makes the string's capacity room for `count` more units without sizing
  // it: a hint of the text's length.
  void Expect(std::size_t count);
  // Room for `count` more units; the units written there count once Commit
  // is given the end of what was written.
  Ch* Claim(std::size_t count) {
    Reserve(count);
    return m_units + m_size;
  }
  void Commit(const Ch* end) { m_size = static_cast<std::size_t>(end - m_units); }
  // Writes into the memory of `storage` from now on, over the text it held;
  // only before anything is written. `storage` is left empty.
  void Adopt(std::u16string& storage);
  // The text written; the output is empty afterwards.
  std::u16string Take();

private:
  void Grow(std::size_t count);

  std::u16string m_text; // units up to m_size are written, the rest is room
  Ch* m_units = nullptr; // m_text's units while it has any
  std::size_t m_size = 0;
  std::size_t m_capacity = 0;
};

// True when one of four units (in one word) may need more than a copy: a
// control character, a quote, a backslash or a surrogate. A lane flags when
// it is zero after the lane's test; a borrow only flags lanes above a true one.
inline bool NeedsCare(std::uint64_t units) {
  constexpr std::uint64_t kOnes = 0x0001000100010001ull;
  constexpr std::uint64_t kHighs = 0x8000800080008000ull;
  const auto hasZero = [](std::uint64_t x) { return (x - kOnes) & ~x & kHighs; };
  const std::uint64_t control = (units - 0x20 * kOnes) & ~units & kHighs;
  return (control | hasZero(units ^ (u'"' * kOnes)) | hasZero(units ^ (u'\\' * kOnes)) |
          hasZero((units & (0xF800 * kOnes)) ^ (0xD800 * kOnes))) != 0;
}

#if defined(__SSE2__)
// The same test for eight units at `text`, in one vector.
inline bool NeedsCare8(const char16_t* text) {
  const __m128i units = _mm_loadu_si128(reinterpret_cast<const __m128i*>(text));
  const __m128i control =
      _mm_cmpeq_epi16(_mm_subs_epu16(units, _mm_set1_epi16(0x1F)), _mm_setzero_si128());
  const __m128i quote = _mm_cmpeq_epi16(units, _mm_set1_epi16(u'"'));
  const __m128i backslash = _mm_cmpeq_epi16(units, _mm_set1_epi16(u'\\'));
  const __m128i surrogate =
      _mm_cmpeq_epi16(_mm_and_si128(units, _mm_set1_epi16(static_cast<short>(0xF800))),
                      _mm_set1_epi16(static_cast<short>(0xD800)));
  return _mm_movemask_epi8(
             _mm_or_si128(_mm_or_si128(control, quote), _mm_or_si128(backslash, surrogate))) != 0;
}
#endif

// Writes the unit `c` that needs more than a copy (a control character, a
// quote, a backslash or a surrogate); `next` is the unit after it, which a
// paired surrogate takes too. Returns the end of what was written.
char16_t* WriteSpecial(char16_t c, const char16_t*& next, const char16_t* end, char16_t* out);

// Writes `text` quoted and escaped at `out` (room for 2 + 6 * length units),
// unpaired surrogates as U+FFFD, and returns the end of it. Inline, so that a
// run of members keeps its constants and loop in one place.
inline char16_t* WriteQuoted(const char16_t* text, std::size_t length, char16_t* out) {
  *out++ = u'"';
  const char16_t* const end = text + length;
  while (text != end) {
#if defined(__SSE2__)
    if (end - text >= 8 && !NeedsCare8(text)) {
      _mm_storeu_si128(reinterpret_cast<__m128i*>(out),
                       _mm_loadu_si128(reinterpret_cast<const __m128i*>(text)));
      text += 8;
      out += 8;
      continue;
    }
#endif
    std::uint64_t units;
    if (end - text >= 4) {
      std::memcpy(&units, text, sizeof units);
      if (!NeedsCare(units)) {
        std::memcpy(out, &units, sizeof units);
        text += 4;
        out += 4;
        continue;
      }
    } else if (length >= 4) {
      // The last few units: when the last four need no care, the units before
      // these few were copied as they are, so all four go in one step.
      std::memcpy(&units, end - 4, sizeof units);
      if (!NeedsCare(units)) {
        out += end - text;
        std::memcpy(out - 4, &units, sizeof units);
        break;
      }
    }
    const char16_t c = *text++;
    if (c >= 0x20 && c != u'"' && c != u'\\' && (c & 0xF800) != 0xD800)
      *out++ = c;
    else
      out = WriteSpecial(c, text, end, out);
  }
  *out++ = u'"';
  return out;
}

// Copies `count` units to `out` a word at a time (a short copy that a call
// to memcpy would cost more than) and returns the end of them.
inline char16_t* CopyUnits(const char16_t* from, std::size_t count, char16_t* out) {
  if (count < 4) {
    for (std::size_t i = 0; i < count; ++i)
      out[i] = from[i];
    return out + count;
  }
  std::size_t i = 0;
  for (; i + 4 <= count; i += 4)
    std::memcpy(out + i, from + i, 8);
  if (i < count) // the last word overlaps what is copied already
    std::memcpy(out + count - 4, from + count - 4, 8);
  return out + count;
}

// The compact layout: exactly the text the JSON library's compact writer gives
// for the same calls (the same escapes, commas and colons), with unpaired
// surrogates written as U+FFFD in the same pass. A call out of place (a value
// where a member name belongs, a second root, a close of the wrong kind)
// returns false and writes nothing.
class CompactWriter {
public:
  // Unpaired surrogates need no repair before String or Key.
  static constexpr bool kRepairsSurrogates = true;

  explicit CompactWriter(TextOutput& out) : m_out(out) {}

  bool StartObject() { return Open(false, u'{'); }
  bool StartArray() { return Open(true, u'['); }
  bool EndObject() { return Close(false, u'}'); }
  bool EndArray() { return Close(true, u']'); }
  // A name is written as a string; so is a string where a name belongs.
  bool Key(const char16_t* text, std::size_t length) { return String(text, length); }
  bool String(const char16_t* text, std::size_t length);
  // A name and its string value, as Key and then String write them.
  bool Member(const char16_t* name, std::size_t nameLength, const char16_t* text,
              std::size_t textLength);
  // Members whose values are strings, each as Member writes it; a member
  // whose `quotedName` is not empty has that copied as its name.
  template <class StringMember> bool Members(const StringMember* members, std::size_t count) {
    if (!AtName()) {
      for (std::size_t i = 0; i < count; ++i)
        if (!Member(members[i].name.data(), members[i].name.size(), members[i].text.data(),
                    members[i].text.size()))
          return false;
      return true;
    }
    std::size_t room = 0;
    for (std::size_t i = 0; i < count; ++i)
      room +=
          6 + members[i].quotedName.size() + 6 * (members[i].name.size() + members[i].text.size());
    Level& level = m_levels.back();
    char16_t* out = m_out.Claim(room);
    for (std::size_t i = 0; i < count; ++i) {
      const StringMember& member = members[i];
      if (level.valueCount > 0)
        *out++ = u',';
      level.valueCount += 2;
      if (member.quotedName.empty()) {
        out = WriteQuoted(member.name.data(), member.name.size(), out);
      } else {
        out = CopyUnits(member.quotedName.data(), member.quotedName.size(), out);
      }
      *out++ = u':';
      out = WriteQuoted(member.text.data(), member.text.size(), out);
    }
    m_out.Commit(out);
    return true;
  }
  bool Bool(bool flag) { return flag ? Raw(u"true", 4) : Raw(u"false", 5); }
  bool Null() { return Raw(u"null", 4); }
  // Text written as it is, such as a number's digits; the kind is not used.
  bool RawValue(const char16_t* text, std::size_t length, int) { return Raw(text, length); }
  bool IsComplete() const { return m_hasRoot && m_levels.empty(); }

private:
  struct Level {
    std::size_t valueCount; // names and values written so far
    bool inArray;
  };

  // True where a member's name belongs.
  bool AtName() const {
    return !m_levels.empty() && !m_levels.back().inArray && m_levels.back().valueCount % 2 == 0;
  }
  // The separator before a value; false when a value cannot go here.
  bool Prefix(bool isString) {
    if (m_levels.empty())
      return Root();
    Level& level = m_levels.back();
    const bool isName = !level.inArray && level.valueCount % 2 == 0;
    if (isName && !isString)
      return false;
    if (level.valueCount++ > 0)
      m_out.Put(level.inArray || isName ? u',' : u':');
    return true;
  }
  // The same for the value at the root: there is only one.
  bool Root();
  bool Open(bool isArray, char16_t bracket);
  bool Close(bool isArray, char16_t bracket);
  bool Raw(const char16_t* text, std::size_t length);

  TextOutput& m_out;
  std::vector<Level> m_levels;
  bool m_hasRoot = false;
};

} // namespace detail
} // namespace Json
