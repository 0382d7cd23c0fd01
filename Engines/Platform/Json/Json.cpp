#include <Json/Json.h>

#include <Internal/JsonText.h>

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
#include <type_traits>

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

// The reader validates the text's UTF-16, and an escaped lone surrogate
// trips one of its checks, so no handler sees an unpaired surrogate.

// The number events of the reader's handlers, for a Handler with Number and
// Fail. Numbers arrive as text (the reader checked their syntax) and are
// converted in RawNumber; the other number events never come.
template <class Handler> class NumberEvents {
public:
  using Ch = char16_t;
  bool Int(int number) { return Self().Number(number); }
  bool Uint(unsigned number) { return Self().Number(number); }
  bool Int64(std::int64_t number) { return Self().Number(static_cast<double>(number)); }
  bool Uint64(std::uint64_t number) { return Self().Number(static_cast<double>(number)); }
  bool Double(double number) { return Self().Number(number); }
  bool RawNumber(const Ch* text, SizeType length, bool) {
    double number = 0;
    if (!ReadNumber(text, length, number))
      return Self().Fail("Number too big to be stored in double");
    return Self().Number(number);
  }

private:
  Handler& Self() { return static_cast<Handler&>(*this); }
};

// SAX handler that builds the value tree. Members of open objects wait on one
// stack, elements of open arrays on another; each value is built in its slot.
// When a container closes its children are moved into a vector of exactly
// their count, so each container allocates once.
class TreeBuilder : public NumberEvents<TreeBuilder> {
  friend class NumberEvents<TreeBuilder>;

public:
  TreeBuilder() { m_inObject.push_back(false); } // the root sits in an array slot

  bool Null() {
    NextSlot();
    return true;
  }
  bool Bool(bool flag) {
    NextSlot().Emplace<bool>(flag);
    return true;
  }
  bool String(const Ch* text, SizeType length, bool) {
    NextSlot().Emplace<ZelStringT<char16_t>>(text, length);
    return true;
  }
  bool Key(const Ch* text, SizeType length, bool) {
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

// True for a writer that repairs unpaired surrogates itself.
template <class Writer, class = void> struct RepairsSurrogates : std::false_type {};
template <class Writer>
struct RepairsSurrogates<Writer, std::void_t<decltype(Writer::kRepairsSurrogates)>>
    : std::bool_constant<Writer::kRepairsSurrogates> {};

// Writes a value tree through a writer of either layout without recursion. Every
// writer call is checked; the first failure ends the walk with false.
template <class Writer> class TreeWriter {
public:
  explicit TreeWriter(Writer& writer) : m_writer(writer) {}

  // Writes `root` whole; true when every piece was written.
  bool Write(const Value& root) {
    std::vector<Frame>& open = m_open;
    open.clear();
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
        return true;
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

  // A name and its string value.
  bool WriteMember(std::u16string_view name, std::u16string_view text) {
    if constexpr (RepairsSurrogates<Writer>::value) {
      if (name.size() > std::numeric_limits<SizeType>::max() ||
          text.size() > std::numeric_limits<SizeType>::max())
        return false;
      return m_writer.Member(name.data(), name.size(), text.data(), text.size());
    } else {
      return WriteText(name, true) && WriteText(text, false);
    }
  }

  bool WriteText(std::u16string_view text, bool isKey) {
    if (text.size() > std::numeric_limits<SizeType>::max())
      return false;
    const char16_t* data = text.data();
    if (!RepairsSurrogates<Writer>::value && HasUnpairedSurrogate(text)) {
      ReplaceUnpairedSurrogates(text, m_scratch);
      data = m_scratch.data();
    }
    const auto length = static_cast<SizeType>(text.size());
    return isKey ? m_writer.Key(data, length) : m_writer.String(data, length);
  }

private:
  struct Frame {
    const Object* object;
    const Array* array;
    std::size_t next;
  };

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
  std::vector<Frame> m_open;
  std::u16string m_scratch;
};

} // namespace

namespace {

// Runs the reader over `buffer` (the text without a leading byte order mark,
// `skipped` units shorter) with `handler`; false, with `errorText` set, when
// the text is not exactly one valid JSON value.
template <class Handler>
bool RunReader(std::u16string& buffer, std::size_t skipped, Handler& handler,
               ZelStringT<char16_t>& errorText) {
  // The reader decodes strings in place and hands numbers over as their
  // text, untouched: the handler converts them, since the reader's own
  // conversion misrounds some (10e308 gives a tiny negative number, 2e-324 is
  // not rounded to zero) and can overflow its exponent arithmetic.
  rapidjson::GenericInsituStringStream<Utf16> stream(buffer.data());
  rapidjson::GenericReader<Utf16, Utf16> reader;
  constexpr unsigned kFlags = rapidjson::kParseIterativeFlag | rapidjson::kParseInsituFlag |
                              rapidjson::kParseValidateEncodingFlag |
                              rapidjson::kParseNumbersAsStringsFlag;
  const unsigned failedChecks = g_failedChecks;
  const rapidjson::ParseResult result = reader.Parse<kFlags>(stream, handler);

  const char* message = nullptr;
  std::size_t offset = 0;
  if (result.IsError()) {
    const bool stoppedByHandler =
        result.Code() == rapidjson::kParseErrorTermination && handler.GetError();
    message = stoppedByHandler ? handler.GetError() : rapidjson::GetParseError_En(result.Code());
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
  errorText = ZelStringT<char16_t>();
  return true;
}

std::size_t ByteOrderMarkLength(const ZelStringT<char16_t>& text) {
  return !text.IsEmpty() && text[0] == kByteOrderMark ? 1 : 0;
}

// SAX handler that builds a Document's nodes. The children of open
// containers wait on a stack; when a container closes they move, in order,
// to the end of the final array and the container records where they start.
class DocumentBuilder : public NumberEvents<DocumentBuilder> {
  friend class NumberEvents<DocumentBuilder>;

public:
  using Node = detail::DocumentNode;

  explicit DocumentBuilder(std::vector<Node>& nodes) : m_nodes(nodes) {}

  bool Null() { return Push(Node{Node::kNull, 0, {}}); }
  bool Bool(bool flag) {
    Node node{Node::kBool, 0, {}};
    node.flag = flag;
    return Push(node);
  }
  bool String(const Ch* text, SizeType length, bool) {
    return Push(Text(Node::kString, text, length));
  }
  bool Key(const Ch* text, SizeType length, bool) { return Push(Text(Node::kName, text, length)); }
  bool StartObject() { return Enter(); }
  bool StartArray() { return Enter(); }
  bool EndObject(SizeType memberCount) { return Leave(Node::kObject, memberCount, 2); }
  bool EndArray(SizeType elementCount) { return Leave(Node::kArray, elementCount, 1); }

  // Moves the root to the end of the final array; once the reader succeeded.
  void Finish() { m_nodes.push_back(m_open.back()); }
  const char* GetError() const { return m_error; }

private:
  static Node Text(Node::Kind kind, const Ch* text, SizeType length) {
    Node node{kind, length, {}};
    node.text = text;
    return node;
  }
  bool Number(double number) {
    Node node{Node::kNumber, 0, {}};
    node.number = number;
    return Push(node);
  }
  bool Push(const Node& node) {
    m_open.push_back(node);
    return true;
  }
  bool Enter() {
    // As Json::Parse counts it: the root's slot is the first level.
    if (++m_depth > kMaxDepth + 1)
      return Fail("Nesting too deep");
    return true;
  }
  bool Leave(Node::Kind kind, SizeType count, std::size_t nodesPerChild) {
    --m_depth;
    const std::size_t children = count * nodesPerChild;
    Node node{kind, count, {}};
    node.first = static_cast<std::uint32_t>(m_nodes.size());
    if (m_nodes.size() + children > std::numeric_limits<std::uint32_t>::max())
      return Fail("Document too large");
    m_nodes.insert(m_nodes.end(), m_open.end() - static_cast<std::ptrdiff_t>(children),
                   m_open.end());
    m_open.resize(m_open.size() - children);
    m_open.push_back(node);
    return true;
  }
  bool Fail(const char* message) {
    m_error = message;
    return false;
  }

  std::vector<Node>& m_nodes;
  std::vector<Node> m_open;
  int m_depth = 1;
  const char* m_error = nullptr;
};

} // namespace

bool Parse(const ZelStringT<char16_t>& text, Value& out, ZelStringT<char16_t>& errorText) {
  const std::size_t skipped = ByteOrderMarkLength(text);
  std::u16string buffer(text.GetView().substr(skipped));
  TreeBuilder builder;
  if (!RunReader(buffer, skipped, builder, errorText))
    return false;
  out = std::move(builder.GetRoot());
  return true;
}

Document::Document() : m_nodes(1, detail::DocumentNode{detail::DocumentNode::kNull, 0, {}}) {}

Document::~Document() = default;

bool Document::Parse(const ZelStringT<char16_t>& text, ZelStringT<char16_t>& errorText) {
  const std::size_t skipped = ByteOrderMarkLength(text);
  m_buffer.assign(text.GetView().substr(skipped));
  m_nodes.clear();
  // Documents of styles spend about ten units of text on a node; one guess
  // saves most of the array's growth steps.
  m_nodes.reserve(m_buffer.size() / 8 + 16);
  DocumentBuilder builder(m_nodes);
  if (!RunReader(m_buffer, skipped, builder, errorText)) {
    m_buffer.clear();
    m_nodes.assign(1, detail::DocumentNode{detail::DocumentNode::kNull, 0, {}});
    return false;
  }
  builder.Finish();
  return true;
}

Value Document::Ref::ToValue() const {
  switch (m_node->kind) {
  case Node::kString:
    return Value(ZelStringT<char16_t>(m_node->text, m_node->size));
  case Node::kNumber:
    return Value(m_node->number);
  case Node::kBool:
    return Value(m_node->flag);
  case Node::kObject: {
    // Nesting is bounded by kMaxDepth, and so is this recursion.
    std::vector<Member> members;
    members.reserve(m_node->size);
    for (std::size_t i = 0; i < m_node->size; ++i)
      members.push_back(Member{ZelStringT<char16_t>(GetMemberName(i)), GetMember(i).ToValue()});
    return Value(Object(std::move(members)));
  }
  case Node::kArray: {
    std::vector<Value> elements;
    elements.reserve(m_node->size);
    for (std::size_t i = 0; i < m_node->size; ++i)
      elements.push_back(GetElement(i).ToValue());
    return Value(Array(std::move(elements)));
  }
  default:
    return Value();
  }
}

void Document::Ref::AssignTo(Value& out) const {
  if (IsString()) {
    if (ZelStringT<char16_t>* text = out.GetIf<ZelStringT<char16_t>>()) {
      text->GetStdString().assign(m_node->text, m_node->size);
      return;
    }
  }
  out = ToValue();
}

namespace detail {

// Found by the JSON library's writers through the stream's namespace: room
// for `count` units, then units put without a check.
inline void PutReserve(TextOutput& stream, std::size_t count) { stream.Reserve(count); }
inline void PutUnsafe(TextOutput& stream, char16_t c) { stream.PutUnsafe(c); }

} // namespace detail

// What Writer forwards to: the compact writer, or RapidJSON's indented one.
struct Writer::Impl {
  using Buffer = detail::TextOutput;
  virtual ~Impl() = default;
  virtual bool StartObject() = 0;
  virtual bool EndObject() = 0;
  virtual bool StartArray() = 0;
  virtual bool EndArray() = 0;
  virtual bool Text(std::u16string_view text, bool isKey) = 0;
  virtual bool Member(std::u16string_view name, std::u16string_view text) = 0;
  virtual bool Write(const Value& value) = 0;
  virtual bool IsComplete() const = 0;

  Buffer buffer;
  unsigned failedChecks = g_failedChecks;
  bool failed = false;
};

namespace {

template <class RapidWriter> struct WriterOf final : Writer::Impl {
  WriterOf() : writer(buffer), tree(writer) {
    if constexpr (std::is_same<RapidWriter, rapidjson::PrettyWriter<Buffer, Utf16, Utf16>>::value)
      writer.SetIndent(' ', 2);
  }
  bool StartObject() override { return writer.StartObject(); }
  bool EndObject() override { return writer.EndObject(); }
  bool StartArray() override { return writer.StartArray(); }
  bool EndArray() override { return writer.EndArray(); }
  bool Text(std::u16string_view text, bool isKey) override { return tree.WriteText(text, isKey); }
  bool Member(std::u16string_view name, std::u16string_view text) override {
    return tree.WriteMember(name, text);
  }
  bool Write(const Value& value) override { return tree.Write(value); }
  bool IsComplete() const override { return writer.IsComplete(); }

  RapidWriter writer;
  TreeWriter<RapidWriter> tree;
};

using CompactWriter = WriterOf<detail::CompactWriter>;
using IndentedWriter = WriterOf<rapidjson::PrettyWriter<Writer::Impl::Buffer, Utf16, Utf16>>;

} // namespace

Writer::Writer(bool format)
    : m_impl(format ? std::unique_ptr<Impl>(new IndentedWriter)
                    : std::unique_ptr<Impl>(new CompactWriter)) {}

Writer::~Writer() = default;

bool Writer::Check(bool written) {
  if (!written)
    m_impl->failed = true;
  return !m_impl->failed;
}

bool Writer::StartObject() { return Check(!m_impl->failed && m_impl->StartObject()); }
bool Writer::EndObject() { return Check(!m_impl->failed && m_impl->EndObject()); }
bool Writer::StartArray() { return Check(!m_impl->failed && m_impl->StartArray()); }
bool Writer::EndArray() { return Check(!m_impl->failed && m_impl->EndArray()); }
bool Writer::Key(std::u16string_view name) {
  return Check(!m_impl->failed && m_impl->Text(name, true));
}
bool Writer::String(std::u16string_view text) {
  return Check(!m_impl->failed && m_impl->Text(text, false));
}
bool Writer::Member(std::u16string_view name, std::u16string_view text) {
  return Check(!m_impl->failed && m_impl->Member(name, text));
}
bool Writer::Write(const Value& value) { return Check(!m_impl->failed && m_impl->Write(value)); }

void Writer::Reserve(std::size_t units) { m_impl->buffer.Reserve(units); }

ZelStringT<char16_t> Writer::TakeText() {
  Impl& impl = *m_impl;
  if (impl.failed || !impl.IsComplete() || g_failedChecks != impl.failedChecks)
    return ZelStringT<char16_t>();
  return ZelStringT<char16_t>(impl.buffer.Take());
}

ZelStringT<char16_t> ValueToString(const Value& value, bool format) {
  Writer writer(format);
  writer.Write(value);
  return writer.TakeText();
}

} // namespace Json
