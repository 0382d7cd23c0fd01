#include <ZelPref/ConversionPolicy.h>

#include <algorithm>
#include <cassert>
#include <charconv>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <system_error>

namespace ZelPref {

namespace Detail {

const char* BadConversion::what() const noexcept { return "ZelPref::Detail::BadConversion"; }

} // namespace Detail

namespace {

[[noreturn]] void Fail() { throw Detail::BadConversion(); }

bool IsAsciiSpace(char c) noexcept {
  return c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\f' || c == '\v';
}

bool IsDigit(char c) noexcept { return c >= '0' && c <= '9'; }

// The text without surrounding ASCII white space, narrowed to 8 bits; throws
// when any character is outside ASCII (no number or flag form uses one).
// Short texts, as numbers are, stay in the string's own buffer.
std::string TrimmedAscii(const ZelStringT<char16_t>& text) {
  std::u16string_view view = text;
  while (!view.empty() && view.front() < 0x80 && IsAsciiSpace(static_cast<char>(view.front())))
    view.remove_prefix(1);
  while (!view.empty() && view.back() < 0x80 && IsAsciiSpace(static_cast<char>(view.back())))
    view.remove_suffix(1);
  std::string ascii(view.size(), '\0');
  char16_t outside = 0;
  for (std::size_t i = 0; i < view.size(); ++i) {
    outside |= view[i] & 0xFF80;
    ascii[i] = static_cast<char>(view[i]);
  }
  if (outside)
    Fail();
  return ascii;
}

// The text that std::from_chars should read (it takes "-" but not "+"), with
// the index of the first character after the sign.
std::string_view ForFromChars(std::string_view text, std::size_t& unsignedStart) {
  unsignedStart = 0;
  if (!text.empty() && text.front() == '+')
    text.remove_prefix(1);
  else if (!text.empty() && text.front() == '-')
    unsignedStart = 1;
  return text;
}

// A finite number in decimal or exponent form; the part after the sign must
// start with a digit or a point so that "inf", "nan" and doubled signs fail.
double ParseNumber(std::string_view text) {
  std::size_t start = 0;
  text = ForFromChars(text, start);
  if (text.size() <= start || !(IsDigit(text[start]) || text[start] == '.'))
    Fail();
  double value = 0;
  const char* end = text.data() + text.size();
  const std::from_chars_result result =
      std::from_chars(text.data(), end, value, std::chars_format::general);
  if (result.ec != std::errc() || result.ptr != end || !std::isfinite(value))
    Fail();
  return value;
}

// True for an optional sign followed by decimal digits only.
bool IsPlainInteger(std::string_view text) {
  std::size_t start = 0;
  text = ForFromChars(text, start);
  if (text.size() <= start)
    return false;
  for (std::size_t i = start; i < text.size(); ++i)
    if (!IsDigit(text[i]))
      return false;
  return true;
}

ZelStringT<char16_t> Widen(const char* first, const char* last) {
  return ZelStringT<char16_t>(std::u16string(first, last));
}

// The number of decimal digits of `value`.
int DigitCount(unsigned long long value) {
  int count = 1;
  for (unsigned long long bound = 10; count < 20 && value >= bound; bound *= 10)
    ++count;
  return count;
}

// True when std::to_chars writes the whole number `value` (not zero) in the
// exponent form, "1.2e+07", because it is shorter than its digits.
bool ExponentIsShorter(unsigned long long value) {
  const int digits = DigitCount(value);
  while (value % 10 == 0)
    value /= 10;
  const int significant = DigitCount(value);
  const int exponentDigits = digits - 1 >= 100 ? 3 : 2;
  return digits > significant + (significant > 1 ? 1 : 0) + 2 + exponentDigits;
}

constexpr char kDigitPairs[] =
    "00010203040506070809101112131415161718192021222324252627282930313233"
    "34353637383940414243444546474849505152535455565758596061626364656667"
    "6869707172737475767778798081828384858687888990919293949596979899";

// std::to_chars' shortest text for the numbers documents mostly hold, whole
// or with at most three decimals, without its general algorithm. Writes into
// `out` (room for 32) and returns the end, or null for any other number.
char16_t* ShortDecimal(double value, char16_t* out) {
  if (value == 0) {
    if (std::signbit(value))
      *out++ = u'-';
    *out++ = u'0';
    return out;
  }
  const double scaled = value * 1000.0;
  if (!(std::fabs(scaled) < 1e15))
    return nullptr;
  // Whole when the conversion, which drops any fraction, loses nothing.
  const long long thousandths = static_cast<long long>(scaled);
  if (static_cast<double>(thousandths) != scaled)
    return nullptr;
  // Exactly the double that the decimal reads back as: with at most fifteen
  // significant digits no shorter decimal reads back the same.
  if (static_cast<double>(thousandths) / 1000.0 != value)
    return nullptr;
  const unsigned long long magnitude = thousandths < 0
                                           ? 0ull - static_cast<unsigned long long>(thousandths)
                                           : static_cast<unsigned long long>(thousandths);
  unsigned long long whole = magnitude / 1000;
  const unsigned fraction = static_cast<unsigned>(magnitude % 1000);
  // Only a whole number ending in zeros can be shorter in the exponent form.
  if (fraction == 0 && whole >= 100000 && ExponentIsShorter(whole))
    return nullptr;
  if (value < 0)
    *out++ = u'-';
  // The whole part from its last digit, two at a time; then the three
  // decimals without their trailing zeros.
  char16_t* const end = out + DigitCount(whole);
  char16_t* digit = end;
  while (whole >= 100) {
    const char* pair = kDigitPairs + 2 * (whole % 100);
    whole /= 100;
    *--digit = static_cast<char16_t>(pair[1]);
    *--digit = static_cast<char16_t>(pair[0]);
  }
  if (whole >= 10) {
    *--digit = static_cast<char16_t>(kDigitPairs[2 * whole + 1]);
    *--digit = static_cast<char16_t>(kDigitPairs[2 * whole]);
  } else {
    *--digit = static_cast<char16_t>(u'0' + whole);
  }
  if (fraction == 0)
    return end;
  char16_t* last = end;
  *last++ = u'.';
  *last++ = static_cast<char16_t>(u'0' + fraction / 100);
  const unsigned rest = fraction % 100;
  if (rest != 0) {
    *last++ = static_cast<char16_t>(u'0' + rest / 10);
    if (rest % 10 != 0)
      *last++ = static_cast<char16_t>(u'0' + rest % 10);
  }
  return last;
}

} // namespace

ConversionPolicy::~ConversionPolicy() = default;

NumberConversionPolicy::~NumberConversionPolicy() = default;

ZelStringT<char16_t> NumberConversionPolicy::ToText(const ZelUtils::Any& value) const {
  const double* number = value.GetIf<double>();
  if (!number || !std::isfinite(*number))
    Fail();
  char16_t text[kMaxTextLength];
  return ZelStringT<char16_t>(text, static_cast<std::size_t>(WriteText(*number, text) - text));
}

char16_t* NumberConversionPolicy::WriteText(double number, char16_t* out) noexcept {
  assert(std::isfinite(number));
  if (char16_t* end = ShortDecimal(number, out))
    return end;
  char buffer[kMaxTextLength];
  const char* end = std::to_chars(buffer, buffer + sizeof buffer, number).ptr;
  for (const char* c = buffer; c != end; ++c)
    *out++ = static_cast<char16_t>(*c);
  return out;
}

// The value of a short plain decimal ("-12.25"): its digits as a whole
// number below 2^53 divided by a power of ten up to 10^22, both exact, so the
// one rounding of the division gives the correctly rounded value. False for
// any other form, which the general reader takes.
bool ReadShortDecimal(std::u16string_view text, double& value) {
  static constexpr double kPowers[] = {1e0, 1e1, 1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                       1e8, 1e9, 1e10, 1e11, 1e12, 1e13, 1e14, 1e15};
  const char16_t* p = text.data();
  const char16_t* const end = p + text.size();
  const bool negative = p != end && *p == u'-';
  p += negative;
  std::uint64_t digits = 0;
  std::size_t count = 0;
  const char16_t* point = nullptr;
  for (; p != end; ++p) {
    const unsigned digit = static_cast<unsigned>(*p) - u'0';
    if (digit < 10) {
      digits = digits * 10 + digit; // wraps only past 15 digits, which fail below
      ++count;
    } else if (*p != u'.' || point) {
      return false;
    } else {
      point = p;
    }
  }
  const std::size_t decimals = point ? static_cast<std::size_t>(end - point - 1) : 0;
  if (count == 0 || count > 15 || (point && decimals == 0))
    return false; // "", "-", "." and "5." go to the general reader
  const double magnitude = static_cast<double>(digits) / kPowers[decimals];
  value = negative ? -magnitude : magnitude;
  return true;
}

ZelUtils::Any NumberConversionPolicy::FromText(const ZelStringT<char16_t>& text) const {
  double value = 0;
  if (ReadShortDecimal(text.GetView(), value))
    return ZelUtils::Any(value);
  return ZelUtils::Any(ParseNumber(TrimmedAscii(text)));
}

IntegerConversionPolicy::~IntegerConversionPolicy() = default;

ZelStringT<char16_t> IntegerConversionPolicy::ToText(const ZelUtils::Any& value) const {
  const int* number = value.GetIf<int>();
  if (!number)
    Fail();
  char buffer[16];
  const std::to_chars_result result = std::to_chars(buffer, buffer + sizeof buffer, *number);
  if (result.ec != std::errc())
    Fail();
  return Widen(buffer, result.ptr);
}

ZelUtils::Any IntegerConversionPolicy::FromText(const ZelStringT<char16_t>& text) const {
  const std::string ascii = TrimmedAscii(text);
  if (IsPlainInteger(ascii)) {
    // Read digits exactly, so that values near the limits are not rounded.
    std::size_t start = 0;
    const std::string_view digits = ForFromChars(ascii, start);
    int value = 0;
    const char* end = digits.data() + digits.size();
    const std::from_chars_result result = std::from_chars(digits.data(), end, value);
    if (result.ec != std::errc() || result.ptr != end)
      Fail();
    return ZelUtils::Any(value);
  }
  // Other forms ("1e+06" as printed by "%g", "2.0") must name a whole number.
  const double number = ParseNumber(ascii);
  if (std::trunc(number) != number || number < static_cast<double>(INT_MIN) ||
      number > static_cast<double>(INT_MAX))
    Fail();
  return ZelUtils::Any(static_cast<int>(number));
}

BooleanConversionPolicy::~BooleanConversionPolicy() = default;

ZelStringT<char16_t> BooleanConversionPolicy::ToText(const ZelUtils::Any& value) const {
  const bool* flag = value.GetIf<bool>();
  if (!flag)
    Fail();
  return ZelStringT<char16_t>(*flag ? u"1" : u"0");
}

ZelUtils::Any BooleanConversionPolicy::FromText(const ZelStringT<char16_t>& text) const {
  std::string ascii = TrimmedAscii(text);
  for (char& c : ascii)
    if (c >= 'A' && c <= 'Z')
      c = static_cast<char>(c - 'A' + 'a');
  if (ascii == "1" || ascii == "true")
    return ZelUtils::Any(true);
  if (ascii == "0" || ascii == "false")
    return ZelUtils::Any(false);
  Fail();
}

TextConversionPolicy::~TextConversionPolicy() = default;

ZelStringT<char16_t> TextConversionPolicy::ToText(const ZelUtils::Any& value) const {
  const ZelStringT<char16_t>* text = value.GetIf<ZelStringT<char16_t>>();
  if (!text)
    Fail();
  return *text;
}

ZelUtils::Any TextConversionPolicy::FromText(const ZelStringT<char16_t>& text) const {
  return ZelUtils::Any(text);
}

} // namespace ZelPref
