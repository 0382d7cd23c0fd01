#include <Json/Json.h>

namespace Json {
namespace {
// Number of RapidJSON internal checks that failed on this thread.
thread_local unsigned g_failedChecks = 0;
} // namespace
} // namespace Json

// Malformed input can reach one of RapidJSON's internal checks (an escaped
// lone low surrogate); that must fail the call, not abort the process.
#define RAPIDJSON_ASSERT(condition)                                                                \
  ((condition) ? static_cast<void>(0) : static_cast<void>(++::Json::g_failedChecks))

#include <rapidjson/encodings.h>
#include <rapidjson/error/en.h>
#include <rapidjson/prettywriter.h>
#include <rapidjson/reader.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <system_error>

namespace Json {
namespace {

using Utf16 = rapidjson::UTF16<char16_t>;
using rapidjson::SizeType;

constexpr char16_t kByteOrderMark = 0xFEFF;

using ZelPlatform::detail::HasUnpairedSurrogate;
using ZelPlatform::detail::ReplaceUnpairedSurrogates;

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

// Converts the text of a JSON number, correctly rounded. Returns false when
// its magnitude is too big for a double; one too small becomes a signed zero.
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

ZelStringT<char16_t> Widen(std::string_view ascii) {
  return ZelStringT<char16_t>(std::u16string(ascii.begin(), ascii.end()));
}

// SAX handler that builds the value tree. Members of open objects wait on one
// stack, elements of open arrays on another; each value is built in its slot.
// When a container closes its children are moved into a vector of exactly
// their count, so each container allocates once.
class TreeBuilder {
public:
  using Ch = char16_t;

  TreeBuilder() { m_inObject.push_back(false); } // the root sits in an array slot

  bool Null() {
    NextSlot();
    return true;
  }
  bool Bool(bool flag) {
    NextSlot().Emplace<bool>(flag);
    return true;
  }
  // Numbers arrive as text (the reader checked their syntax) and are
  // converted in RawNumber; the other number events never come.
  bool Int(int number) { return Number(number); }
  bool Uint(unsigned number) { return Number(number); }
  bool Int64(std::int64_t number) { return Number(static_cast<double>(number)); }
  bool Uint64(std::uint64_t number) { return Number(static_cast<double>(number)); }
  bool Double(double number) { return Number(number); }
  bool RawNumber(const Ch* text, SizeType length, bool) {
    double number = 0;
    if (!ReadNumber(text, length, number))
      return Fail("Number too big to be stored in double");
    return Number(number);
  }
  bool String(const Ch* text, SizeType length, bool) {
    if (HasUnpairedSurrogate(std::u16string_view(text, length)))
      return Fail("Unpaired surrogate in string");
    NextSlot().Emplace<ZelStringT<char16_t>>(text, length);
    return true;
  }
  bool Key(const Ch* text, SizeType length, bool) {
    if (HasUnpairedSurrogate(std::u16string_view(text, length)))
      return Fail("Unpaired surrogate in member name");
    m_members.emplace_back();
    m_members.back().name.GetStdString().assign(text, length);
    return true;
  }
  bool StartObject() { return Enter(true); }
  bool StartArray() { return Enter(false); }
  bool EndObject(SizeType memberCount) {
    Leave();
    const auto first = m_members.end() - memberCount;
    std::vector<Member> members(std::make_move_iterator(first),
                                std::make_move_iterator(m_members.end()));
    m_members.erase(first, m_members.end());
    Slot().Emplace<Object>(std::move(members));
    return true;
  }
  bool EndArray(SizeType elementCount) {
    Leave();
    const auto first = m_elements.end() - elementCount;
    std::vector<Value> elements(std::make_move_iterator(first),
                                std::make_move_iterator(m_elements.end()));
    m_elements.erase(first, m_elements.end());
    Slot().Emplace<Array>(std::move(elements));
    return true;
  }

  // The parsed value; valid once the reader has succeeded.
  Value& GetRoot() { return m_elements.front(); }
  // Why the handler stopped the reader, or null if it did not.
  const char* GetError() const { return m_error; }

private:
  // The slot of the value that starts now: the pending member's value in an
  // object (its name came first), a new element in an array.
  Value& NextSlot() {
    if (m_inObject.back())
      return m_members.back().value;
    m_elements.emplace_back();
    return m_elements.back();
  }
  // The slot of the container that has just closed, taken when it opened.
  Value& Slot() { return m_inObject.back() ? m_members.back().value : m_elements.back(); }

  bool Number(double number) {
    NextSlot().Emplace<double>(number);
    return true;
  }
  bool Enter(bool isObject) {
    if (static_cast<int>(m_inObject.size()) > kMaxDepth)
      return Fail("Nesting too deep");
    NextSlot();
    m_inObject.push_back(isObject);
    return true;
  }
  void Leave() { m_inObject.pop_back(); }
  bool Fail(const char* message) {
    m_error = message;
    return false;
  }

  std::vector<Member> m_members;
  std::vector<Value> m_elements;
  std::vector<bool> m_inObject; // kind of each open container, outermost first
  const char* m_error = nullptr;
};

// Writes a value tree through a RapidJSON writer without recursion. Every
// writer call is checked; the first failure ends the walk with false.
template <class Writer> class TreeWriter {
public:
  explicit TreeWriter(Writer& writer) : m_writer(writer) {}

  bool Write(const Value& root) {
    struct Frame {
      const Object* object;
      const Array* array;
      std::size_t next;
    };
    std::vector<Frame> open;
    const Value* pending = &root;
    for (;;) {
      if (pending) {
        if (const Object* object = pending->GetIf<Object>()) {
          if (!m_writer.StartObject())
            return false;
          open.push_back(Frame{object, nullptr, 0});
        } else if (const Array* array = pending->GetIf<Array>()) {
          if (!m_writer.StartArray())
            return false;
          open.push_back(Frame{nullptr, array, 0});
        } else if (!WriteScalar(*pending)) {
          return false;
        }
        pending = nullptr;
      }
      if (open.empty())
        return m_writer.IsComplete();
      Frame& top = open.back();
      if (top.object) {
        if (top.next == top.object->GetSize()) {
          if (!m_writer.EndObject())
            return false;
          open.pop_back();
          continue;
        }
        const std::size_t i = top.next++;
        if (!WriteText(top.object->GetValueName(i), true))
          return false;
        pending = &top.object->GetValue(i);
      } else {
        if (top.next == top.array->GetSize()) {
          if (!m_writer.EndArray())
            return false;
          open.pop_back();
          continue;
        }
        pending = &top.array->GetValue(top.next++);
      }
    }
  }

private:
  bool WriteScalar(const Value& value) {
    if (const auto* text = value.GetIf<ZelStringT<char16_t>>())
      return WriteText(text->GetView(), false);
    if (const double* number = value.GetIf<double>())
      return WriteNumber(*number);
    if (const bool* flag = value.GetIf<bool>())
      return m_writer.Bool(*flag);
    if (const auto* utf8 = value.GetIf<ZelStringT<char>>()) {
      return WriteText(ZelPlatform::Utf8ToUtf16(utf8->GetView()), false);
    }
    return m_writer.Null();
  }

  bool WriteText(std::u16string_view text, bool isKey) {
    if (text.size() > std::numeric_limits<SizeType>::max())
      return false;
    const char16_t* data = text.data();
    if (HasUnpairedSurrogate(text)) {
      ReplaceUnpairedSurrogates(text, m_scratch);
      data = m_scratch.data();
    }
    const auto length = static_cast<SizeType>(text.size());
    return isKey ? m_writer.Key(data, length) : m_writer.String(data, length);
  }

  // The shortest text that reads back as the same double; integers without
  // a fraction. Negative zero gets one so that readers keep its sign.
  bool WriteNumber(double number) {
    if (!std::isfinite(number))
      return m_writer.Null();
    char ascii[32];
    const std::to_chars_result result = std::to_chars(ascii, ascii + sizeof ascii, number);
    if (result.ec != std::errc())
      return false;
    std::string_view digits(ascii, static_cast<std::size_t>(result.ptr - ascii));
    if (digits == "-0")
      digits = "-0.0";
    char16_t wide[32];
    for (std::size_t i = 0; i < digits.size(); ++i)
      wide[i] = static_cast<char16_t>(digits[i]);
    return m_writer.RawValue(wide, digits.size(), rapidjson::kNumberType);
  }

  Writer& m_writer;
  std::u16string m_scratch;
};

} // namespace

bool Parse(const ZelStringT<char16_t>& text, Value& out, ZelStringT<char16_t>& errorText) {
  const std::size_t skipped = !text.IsEmpty() && text[0] == kByteOrderMark ? 1 : 0;
  // The reader works on a copy that it may overwrite: it decodes strings in
  // place and hands numbers over as their text, untouched.
  std::u16string buffer(text.GetView().substr(skipped));
  rapidjson::GenericInsituStringStream<Utf16> stream(buffer.data());
  TreeBuilder builder;
  rapidjson::GenericReader<Utf16, Utf16> reader;
  // Numbers are converted by the builder: the reader's own conversion
  // misrounds some (10e308 gives a tiny negative number, 2e-324 is not
  // rounded to zero) and can overflow its exponent arithmetic.
  constexpr unsigned kFlags = rapidjson::kParseIterativeFlag | rapidjson::kParseInsituFlag |
                              rapidjson::kParseValidateEncodingFlag |
                              rapidjson::kParseNumbersAsStringsFlag;
  const unsigned failedChecks = g_failedChecks;
  const rapidjson::ParseResult result = reader.Parse<kFlags>(stream, builder);

  const char* message = nullptr;
  std::size_t offset = 0;
  if (result.IsError()) {
    const bool stoppedByBuilder =
        result.Code() == rapidjson::kParseErrorTermination && builder.GetError();
    message = stoppedByBuilder ? builder.GetError() : rapidjson::GetParseError_En(result.Code());
    offset = result.Offset() + skipped;
  } else if (g_failedChecks != failedChecks) {
    message = "Invalid text";
    offset = stream.Tell() + skipped;
  } else if (stream.Tell() != buffer.size()) {
    // A NUL inside the text ends the stream early; what follows it is not JSON.
    message = "Unexpected NUL character";
    offset = stream.Tell() + skipped;
  }
  if (message) {
    std::string_view description(message);
    if (!description.empty() && description.back() == '.')
      description.remove_suffix(1);
    errorText = Widen(description) + u" at offset " + Widen(std::to_string(offset));
    return false;
  }
  out = std::move(builder.GetRoot());
  errorText = ZelStringT<char16_t>();
  return true;
}

ZelStringT<char16_t> ValueToString(const Value& value, bool format) {
  using Buffer = rapidjson::GenericStringBuffer<Utf16>;
  Buffer buffer;
  const unsigned failedChecks = g_failedChecks;
  bool written = false;
  if (format) {
    rapidjson::PrettyWriter<Buffer, Utf16, Utf16> writer(buffer);
    writer.SetIndent(' ', 2);
    written = TreeWriter<decltype(writer)>(writer).Write(value);
  } else {
    rapidjson::Writer<Buffer, Utf16, Utf16> writer(buffer);
    written = TreeWriter<decltype(writer)>(writer).Write(value);
  }
  if (!written || g_failedChecks != failedChecks)
    return ZelStringT<char16_t>();
  return ZelStringT<char16_t>(buffer.GetString(), buffer.GetSize() / sizeof(char16_t));
}

} // namespace Json
