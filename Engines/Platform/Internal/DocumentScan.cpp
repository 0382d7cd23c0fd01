// The quick scan of well-formed JSON text into a document's arrays, and the
// correctly rounded reading of a number's text that both readers share.
#include <Internal/DocumentScan.h>

#include <algorithm>
#include <charconv>
#include <cstddef>
#include <string>
#include <system_error>

#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace Json {
namespace detail {

namespace {

// The decimal exponent of the first non-zero digit of a JSON number, with
// the exponent part clamped so that it cannot overflow; 0 when all digits are 0.
long LeadingDecimalExponent(std::string_view number) {
  std::size_t i = number.empty() || number[0] != '-' ? 0 : 1;
  const std::size_t integerEnd = std::min(number.find_first_of(".eE", i), number.size());
  long position = static_cast<long>(integerEnd - i) - 1; // exponent of the digit at i
  for (; i < number.size() && number[i] != 'e' && number[i] != 'E'; ++i) {
    if (number[i] == '.')
      continue;
    if (number[i] != '0')
      break;
    --position;
  }
  if (i == number.size() || number[i] == 'e' || number[i] == 'E')
    return 0;
  const std::size_t e = number.find_first_of("eE", i);
  if (e == std::string_view::npos)
    return position;
  std::size_t k = e + 1;
  const bool negative = k < number.size() && number[k] == '-';
  if (k < number.size() && (number[k] == '-' || number[k] == '+'))
    ++k;
  long exponent = 0;
  for (; k < number.size() && exponent < 100000000; ++k)
    exponent = exponent * 10 + (number[k] - '0');
  return position + (negative ? -exponent : exponent);
}

bool IsDigit(char16_t c) { return c >= u'0' && c <= u'9'; }

// The scan itself. The text ends in a NUL, which no valid JSON holds, so
// every look ahead stops there without a bounds check.
class Scanner {
public:
  Scanner(std::u16string_view source, std::u16string& copies, std::vector<double>& numbers,
          std::vector<DocumentNode>& nodes, std::vector<std::uint8_t>& kinds)
      : m_source(source), m_end(source.data() + source.size()), m_copies(copies),
        m_numbers(numbers), m_nodes(nodes), m_kinds(kinds) {}

  bool Run() {
    const char16_t* p = SkipSpace(m_source.data());
    // Only a container at the root; a lone value is left to the reader.
    if (*p != u'{' && *p != u'[')
      return false;
    for (;;) {
      // A value starts at p.
      switch (*p) {
      case u'{':
      case u'[': {
        const bool isObject = *p == u'{';
        if (m_open.size() >= static_cast<std::size_t>(kMaxDepth))
          return false;
        m_open.push_back(Open{0, isObject});
        p = SkipSpace(p + 1);
        if (*p == (isObject ? u'}' : u']')) {
          ++p;
          Close();
          break;
        }
        if (isObject && !(p = Name(p)))
          return false;
        continue;
      }
      case u'"':
        if (!(p = String(p, DocumentNode::kString)))
          return false;
        break;
      case u't':
        if (p[1] != u'r' || p[2] != u'u' || p[3] != u'e')
          return false;
        p += 4;
        Push(DocumentNode::kBool, DocumentNode{0, 1});
        break;
      case u'f':
        if (p[1] != u'a' || p[2] != u'l' || p[3] != u's' || p[4] != u'e')
          return false;
        p += 5;
        Push(DocumentNode::kBool, DocumentNode{0, 0});
        break;
      case u'n':
        if (p[1] != u'u' || p[2] != u'l' || p[3] != u'l')
          return false;
        p += 4;
        Push(DocumentNode::kNull, DocumentNode{0, 0});
        break;
      default:
        if (!(p = Number(p)))
          return false;
        break;
      }
      // A value has ended before p: what follows it closes containers or
      // starts the next member or element.
      for (;;) {
        p = SkipSpace(p);
        if (m_open.empty()) {
          if (p != m_end)
            return false;
          m_nodes.push_back(m_pendingNodes.back());
          m_kinds.push_back(m_pendingKinds.back());
          return true;
        }
        Open& top = m_open.back();
        ++top.count;
        if (*p == u',') {
          p = SkipSpace(p + 1);
          if (top.isObject && !(p = Name(p)))
            return false;
          break;
        }
        if (*p != (top.isObject ? u'}' : u']'))
          return false;
        ++p;
        Close();
      }
    }
  }

private:
  struct Open {
    std::uint32_t count; // members or elements read so far
    bool isObject;
  };

  static const char16_t* SkipSpace(const char16_t* p) {
    while (*p == u' ' || *p == u'\n' || *p == u'\r' || *p == u'\t')
      ++p;
    return p;
  }

  void Push(std::uint8_t kind, DocumentNode node) {
    m_pendingNodes.push_back(node);
    m_pendingKinds.push_back(kind);
  }

  // Moves the children of the innermost container to the final arrays and
  // leaves the container itself waiting in its parent.
  void Close() {
    const Open open = m_open.back();
    m_open.pop_back();
    const std::size_t children = open.count * (open.isObject ? 2u : 1u);
    const DocumentNode node{open.count, static_cast<std::uint32_t>(m_nodes.size())};
    const auto from = static_cast<std::ptrdiff_t>(m_pendingNodes.size() - children);
    m_nodes.insert(m_nodes.end(), m_pendingNodes.begin() + from, m_pendingNodes.end());
    m_kinds.insert(m_kinds.end(), m_pendingKinds.begin() + from, m_pendingKinds.end());
    m_pendingNodes.resize(m_pendingNodes.size() - children);
    m_pendingKinds.resize(m_pendingKinds.size() - children);
    Push(open.isObject ? DocumentNode::kObject : DocumentNode::kArray, node);
  }

  // A member's name at p, then its colon; the position of its value, or null.
  const char16_t* Name(const char16_t* p) {
    if (*p != u'"' || !(p = String(p, DocumentNode::kName)))
      return nullptr;
    p = SkipSpace(p);
    return *p == u':' ? SkipSpace(p + 1) : nullptr;
  }

  // The string whose opening quote is at p; the position after its closing
  // quote, or null. Text without escapes stays where it is.
  const char16_t* String(const char16_t* p, std::uint8_t kind) {
    const char16_t* const start = ++p;
    p = SkipPlain(p);
    for (;;) {
      const char16_t c = *p;
      if (c == u'"')
        break;
      if (c < 0x20 || c == u'\\' || (c & 0xF800) == 0xD800) {
        if (c == u'\\')
          return Escaped(start, p, kind);
        if (!Surrogates(p))
          return nullptr;
        continue;
      }
      ++p;
    }
    Push(kind, DocumentNode{static_cast<std::uint32_t>(p - start),
                            static_cast<std::uint32_t>(start - m_source.data())});
    return p + 1;
  }

  // The first unit from p on that is a quote, a backslash, a control unit or
  // a surrogate, eight units at a time where the text has them; else p.
  const char16_t* SkipPlain(const char16_t* p) const {
#if defined(__SSE2__)
    const __m128i quote = _mm_set1_epi16(u'"');
    const __m128i backslash = _mm_set1_epi16(u'\\');
    const __m128i signBit = _mm_set1_epi16(static_cast<short>(0x8000));
    // Units below 0x20 once flipped into signed order.
    const __m128i controlLimit = _mm_set1_epi16(static_cast<short>(0x20 ^ 0x8000));
    const __m128i surrogateMask = _mm_set1_epi16(static_cast<short>(0xF800));
    const __m128i surrogate = _mm_set1_epi16(static_cast<short>(0xD800));
    while (m_end - p >= 8) {
      const __m128i units = _mm_loadu_si128(reinterpret_cast<const __m128i*>(p));
      __m128i special =
          _mm_or_si128(_mm_cmpeq_epi16(units, quote), _mm_cmpeq_epi16(units, backslash));
      special = _mm_or_si128(special, _mm_cmplt_epi16(_mm_xor_si128(units, signBit), controlLimit));
      special =
          _mm_or_si128(special, _mm_cmpeq_epi16(_mm_and_si128(units, surrogateMask), surrogate));
      const int mask = _mm_movemask_epi8(special);
      if (mask != 0)
        return p + __builtin_ctz(static_cast<unsigned>(mask)) / 2;
      p += 8;
    }
#endif
    return p;
  }

  // Steps p over a high surrogate and its low one; false for anything else.
  static bool Surrogates(const char16_t*& p) {
    if (p[0] < 0xD800 || p[0] > 0xDBFF || (p[1] & 0xFC00) != 0xDC00)
      return false;
    p += 2;
    return true;
  }

  // The rest of a string from its first escape at p: decoded into the copies.
  // Kept apart so that the usual string, without escapes, takes a short path.
  [[gnu::noinline]] const char16_t* Escaped(const char16_t* start, const char16_t* p, std::uint8_t kind) {
    const std::size_t offset = m_copies.size();
    m_copies.append(start, static_cast<std::size_t>(p - start));
    for (;;) {
      const char16_t c = *p;
      if (c == u'"')
        break;
      if (c == u'\\') {
        char16_t decoded;
        switch (p[1]) {
        case u'"':
          decoded = u'"';
          break;
        case u'\\':
          decoded = u'\\';
          break;
        case u'/':
          decoded = u'/';
          break;
        case u'b':
          decoded = u'\b';
          break;
        case u'f':
          decoded = u'\f';
          break;
        case u'n':
          decoded = u'\n';
          break;
        case u'r':
          decoded = u'\r';
          break;
        case u't':
          decoded = u'\t';
          break;
        case u'u': {
          unsigned code = 0;
          for (int i = 2; i < 6; ++i) {
            const char16_t h = p[i];
            const unsigned digit = IsDigit(h) ? h - u'0'
                                   : (h | 0x20) >= u'a' && (h | 0x20) <= u'f'
                                       ? (h | 0x20) - u'a' + 10
                                       : 16;
            if (digit == 16)
              return nullptr;
            code = code * 16 + digit;
          }
          // Escaped surrogates, paired or not, are the reader's to judge.
          if (code >= 0xD800 && code <= 0xDFFF)
            return nullptr;
          m_copies.push_back(static_cast<char16_t>(code));
          p += 6;
          continue;
        }
        default:
          return nullptr;
        }
        m_copies.push_back(decoded);
        p += 2;
        continue;
      }
      if (c < 0x20)
        return nullptr;
      if ((c & 0xF800) == 0xD800) {
        const char16_t* pair = p;
        if (!Surrogates(p))
          return nullptr;
        m_copies.append(pair, 2);
        continue;
      }
      m_copies.push_back(c);
      ++p;
    }
    Push(kind | DocumentNode::kCopied,
         DocumentNode{static_cast<std::uint32_t>(m_copies.size() - offset),
                      static_cast<std::uint32_t>(offset)});
    return p + 1;
  }

  // The number at p; the position after it, or null. Integer parts beyond 18
  // digits and exponents beyond 308 are left to the reader, which has limits
  // of its own there.
  const char16_t* Number(const char16_t* p) {
    const char16_t* const start = p;
    if (*p == u'-')
      ++p;
    if (*p == u'0') {
      ++p;
    } else {
      const char16_t* const digits = p;
      while (IsDigit(*p))
        ++p;
      if (p == digits || p - digits > 18)
        return nullptr;
    }
    if (*p == u'.') {
      if (!IsDigit(*++p))
        return nullptr;
      while (IsDigit(*p))
        ++p;
    }
    if (*p == u'e' || *p == u'E') {
      ++p;
      const bool negative = *p == u'-';
      if (*p == u'+' || *p == u'-')
        ++p;
      if (!IsDigit(*p))
        return nullptr;
      unsigned exponent = 0;
      for (; IsDigit(*p); ++p)
        exponent = std::min(exponent * 10 + (*p - u'0'), 100000u);
      if (!negative && exponent > 308)
        return nullptr;
    }
    double number = 0;
    if (!ReadNumber(start, static_cast<std::size_t>(p - start), number))
      return nullptr;
    m_numbers.push_back(number);
    Push(DocumentNode::kNumber, DocumentNode{0, static_cast<std::uint32_t>(m_numbers.size() - 1)});
    return p;
  }

  std::u16string_view m_source;
  const char16_t* m_end; // the NUL after the text
  std::u16string& m_copies;
  std::vector<double>& m_numbers;
  std::vector<DocumentNode>& m_nodes;
  std::vector<std::uint8_t>& m_kinds;
  std::vector<Open> m_open;
  std::vector<DocumentNode> m_pendingNodes; // the children of open containers, and their kinds
  std::vector<std::uint8_t> m_pendingKinds;
};

} // namespace

bool ReadNumber(const char16_t* text, std::size_t length, double& number) {
  char fixed[64];
  std::string grown;
  char* ascii = fixed;
  if (length > sizeof fixed) {
    grown.resize(length);
    ascii = grown.data();
  }
  for (std::size_t i = 0; i < length; ++i)
    ascii[i] = static_cast<char>(text[i]);
  const std::from_chars_result result = std::from_chars(ascii, ascii + length, number);
  if (result.ec == std::errc() && result.ptr == ascii + length)
    return true;
  if (result.ec != std::errc::result_out_of_range ||
      LeadingDecimalExponent(std::string_view(ascii, length)) >= 0)
    return false;
  number = ascii[0] == '-' ? -0.0 : 0.0;
  return true;
}

bool ScanDocument(std::u16string_view source, std::u16string& copies, std::vector<double>& numbers,
                  std::vector<DocumentNode>& nodes, std::vector<std::uint8_t>& kinds) {
  return Scanner(source, copies, numbers, nodes, kinds).Run();
}

} // namespace detail
} // namespace Json
