#include <Json/Json.h>

#include <Internal/DocumentScan.h>
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
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string>
#include <string_view>
#include <system_error>
#include <type_traits>
#include <vector>

namespace Json {
namespace {

using Utf16 = rapidjson::UTF16<char16_t>;
using rapidjson::SizeType;

constexpr char16_t kByteOrderMark = 0xFEFF;

using ZelPlatform::detail::HasUnpairedSurrogate;
using ZelPlatform::detail::ReplaceUnpairedSurrogates;

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
    if (!detail::ReadNumber(text, length, number))
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

  bool WriteMembers(const Json::Writer::StringMember* members, std::size_t count) {
    if constexpr (RepairsSurrogates<Writer>::value) {
      for (std::size_t i = 0; i < count; ++i)
        if (members[i].name.size() > std::numeric_limits<SizeType>::max() ||
            members[i].text.size() > std::numeric_limits<SizeType>::max())
          return false;
      return m_writer.Members(members, count);
    } else {
      for (std::size_t i = 0; i < count; ++i)
        if (!WriteMember(members[i].name, members[i].text))
          return false;
      return true;
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

// The reader's stack allocator where it reads a text without changing it.
// There the reader copies a number into UTF-16 by reading it from its stack
// while writing to the same stack, and a write that grew the stack freed the
// block still being read; grown-out blocks are therefore kept until the
// reader goes. Nothing reads that copy: the document reads numbers from the
// text.
class KeepingAllocator {
public:
  KeepingAllocator() = default;
  KeepingAllocator(const KeepingAllocator&) = delete;
  KeepingAllocator& operator=(const KeepingAllocator&) = delete;
  ~KeepingAllocator() {
    for (void* block : m_retired)
      std::free(block);
  }
  void* Malloc(std::size_t size) { return size ? std::malloc(size) : nullptr; }
  void* Realloc(void* original, std::size_t originalSize, std::size_t newSize) {
    m_retired.push_back(nullptr); // room first, so that nothing below throws
    void* block = newSize ? std::malloc(newSize) : nullptr;
    if (newSize && !block) {
      m_retired.pop_back();
      return nullptr;
    }
    if (original && block)
      std::memcpy(block, original, std::min(originalSize, newSize));
    m_retired.back() = original;
    return block;
  }
  static void Free(void* block) { std::free(block); }

private:
  std::vector<void*> m_retired;
};

// Runs the reader over `stream`, the text without a leading byte order mark
// (`skipped` units shorter, `length` units long), with `handler`; false, with
// `errorText` set, when the text is not exactly one valid JSON value.
template <unsigned kExtraFlags, class Stream, class Handler>
bool RunReader(Stream& stream, std::size_t length, std::size_t skipped, Handler& handler,
               ZelStringT<char16_t>& errorText) {
  // The reader hands numbers over as their text, untouched: the handler
  // converts them, since the reader's own conversion misrounds some (10e308
  // gives a tiny negative number, 2e-324 is not rounded to zero) and can
  // overflow its exponent arithmetic.
  using StackAllocator = std::conditional_t<(kExtraFlags & rapidjson::kParseInsituFlag) != 0,
                                            rapidjson::CrtAllocator, KeepingAllocator>;
  rapidjson::GenericReader<Utf16, Utf16, StackAllocator> reader;
  constexpr unsigned kFlags = rapidjson::kParseIterativeFlag |
                              rapidjson::kParseValidateEncodingFlag |
                              rapidjson::kParseNumbersAsStringsFlag | kExtraFlags;
  const unsigned failedChecks = g_failedChecks;
  const rapidjson::ParseResult result = reader.template Parse<kFlags>(stream, handler);

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
  } else if (stream.Tell() != length) {
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
// to the end of the final arrays and the container records where they start.
// A string whose decoded text equals the text between its quotes (it has no
// escape) is kept as an offset into the text, which the reader's stream,
// while a string is read, still shows at its opening quote.
class DocumentBuilder : public NumberEvents<DocumentBuilder> {
  friend class NumberEvents<DocumentBuilder>;

public:
  using Node = detail::DocumentNode;
  using Stream = rapidjson::GenericStringStream<Utf16>;

  DocumentBuilder(const Stream& stream, std::u16string_view source, std::u16string& copies,
                  std::vector<double>& numbers, std::vector<Node>& nodes,
                  std::vector<std::uint8_t>& kinds)
      : m_stream(stream), m_source(source), m_copies(copies), m_numbers(numbers), m_nodes(nodes),
        m_kinds(kinds) {}

  bool Null() { return Push(Node::kNull, Node{0, 0}); }
  bool Bool(bool flag) { return Push(Node::kBool, Node{0, flag}); }
  bool String(const Ch* text, SizeType length, bool) { return Text(Node::kString, text, length); }
  bool Key(const Ch* text, SizeType length, bool) { return Text(Node::kName, text, length); }
  // The reader's own copy of a number is garbled when it parses into UTF-16
  // from a text it does not change, so the number is read from the text,
  // where the stream still points at its first unit; the reader checked it.
  bool RawNumber(const Ch*, SizeType, bool) {
    // The number's extent by the JSON grammar, as the reader took it: a sign,
    // digits, a fraction, an exponent; what follows is the reader's to judge.
    const std::size_t start = m_stream.Tell();
    std::size_t end = start;
    const auto digits = [&] {
      while (end < m_source.size() && m_source[end] >= u'0' && m_source[end] <= u'9')
        ++end;
    };
    if (end < m_source.size() && m_source[end] == u'-')
      ++end;
    if (end < m_source.size() && m_source[end] == u'0')
      ++end; // a leading zero stands alone
    else
      digits();
    if (end < m_source.size() && m_source[end] == u'.') {
      ++end;
      digits();
    }
    if (end < m_source.size() && (m_source[end] == u'e' || m_source[end] == u'E')) {
      ++end;
      if (end < m_source.size() && (m_source[end] == u'+' || m_source[end] == u'-'))
        ++end;
      digits();
    }
    return NumberEvents<DocumentBuilder>::RawNumber(m_source.data() + start,
                                                    static_cast<SizeType>(end - start), false);
  }
  bool StartObject() { return Enter(); }
  bool StartArray() { return Enter(); }
  bool EndObject(SizeType memberCount) { return Leave(Node::kObject, memberCount, 2); }
  bool EndArray(SizeType elementCount) { return Leave(Node::kArray, elementCount, 1); }

  // Moves the root to the end of the final arrays; once the reader succeeded.
  void Finish() {
    m_nodes.push_back(m_openNodes.back());
    m_kinds.push_back(m_openKinds.back());
  }
  const char* GetError() const { return m_error; }

private:
  bool Text(std::uint8_t kind, const Ch* text, SizeType length) {
    const std::size_t quote = m_stream.Tell();
    if (quote < m_source.size() && m_source[quote] == u'"' &&
        m_source.substr(quote + 1, length) == std::u16string_view(text, length))
      return Push(kind, Node{length, static_cast<std::uint32_t>(quote + 1)});
    if (m_copies.size() + length > std::numeric_limits<std::uint32_t>::max())
      return Fail("Document too large");
    const Node node{length, static_cast<std::uint32_t>(m_copies.size())};
    m_copies.append(text, length);
    return Push(kind | Node::kCopied, node);
  }
  bool Number(double number) {
    if (m_numbers.size() >= std::numeric_limits<std::uint32_t>::max())
      return Fail("Document too large");
    m_numbers.push_back(number);
    return Push(Node::kNumber, Node{0, static_cast<std::uint32_t>(m_numbers.size() - 1)});
  }
  bool Push(std::uint8_t kind, const Node& node) {
    m_openNodes.push_back(node);
    m_openKinds.push_back(kind);
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
    if (m_nodes.size() + children > std::numeric_limits<std::uint32_t>::max())
      return Fail("Document too large");
    const Node node{count, static_cast<std::uint32_t>(m_nodes.size())};
    const auto from = static_cast<std::ptrdiff_t>(m_openNodes.size() - children);
    m_nodes.insert(m_nodes.end(), m_openNodes.begin() + from, m_openNodes.end());
    m_kinds.insert(m_kinds.end(), m_openKinds.begin() + from, m_openKinds.end());
    m_openNodes.resize(m_openNodes.size() - children);
    m_openKinds.resize(m_openKinds.size() - children);
    return Push(kind, node);
  }
  bool Fail(const char* message) {
    m_error = message;
    return false;
  }

  const Stream& m_stream;
  std::u16string_view m_source;
  std::u16string& m_copies;
  std::vector<double>& m_numbers;
  std::vector<Node>& m_nodes;
  std::vector<std::uint8_t>& m_kinds;
  std::vector<Node> m_openNodes; // the children of open containers, and their kinds
  std::vector<std::uint8_t> m_openKinds;
  int m_depth = 1;
  const char* m_error = nullptr;
};

} // namespace

bool Parse(const ZelStringT<char16_t>& text, Value& out, ZelStringT<char16_t>& errorText) {
  const std::size_t skipped = ByteOrderMarkLength(text);
  std::u16string buffer(text.GetView().substr(skipped));
  TreeBuilder builder;
  // The reader decodes strings in place, in this copy of the text.
  rapidjson::GenericInsituStringStream<Utf16> stream(buffer.data());
  if (!RunReader<rapidjson::kParseInsituFlag>(stream, buffer.size(), skipped, builder, errorText))
    return false;
  out = std::move(builder.GetRoot());
  return true;
}

Document::Document() { Reset(); }

Document::~Document() = default;

void Document::Reset() {
  m_owned.clear();
  m_source = nullptr;
  m_copies.clear();
  m_numbers.clear();
  m_nodes.assign(1, detail::DocumentNode{0, 0});
  m_kinds.assign(1, detail::DocumentNode::kNull);
}

bool Document::Parse(const ZelStringT<char16_t>& text, ZelStringT<char16_t>& errorText) {
  Reset();
  m_owned = text.GetStdString();
  return Read(m_owned, errorText);
}

bool Document::ParseBorrowed(const ZelStringT<char16_t>& text, ZelStringT<char16_t>& errorText) {
  Reset();
  return Read(text.GetView(), errorText);
}

bool Document::Read(std::u16string_view text, ZelStringT<char16_t>& errorText) {
  const std::size_t skipped = !text.empty() && text[0] == kByteOrderMark ? 1 : 0;
  const std::u16string_view source = text.substr(skipped);
  if (source.size() > std::numeric_limits<std::uint32_t>::max()) {
    errorText = u"Document too large at offset 0";
    Reset();
    return false;
  }
  m_nodes.clear();
  m_kinds.clear();
  // Documents of styles spend about ten units of text on a node; one guess
  // saves most of the arrays' growth steps.
  m_nodes.reserve(source.size() / 8 + 16);
  m_kinds.reserve(source.size() / 8 + 16);
  // Plainly well-formed text takes the quick scan; the reader reads the rest
  // afresh, with its exact messages.
  if (detail::ScanDocument(source, m_copies, m_numbers, m_nodes, m_kinds)) {
    errorText = ZelStringT<char16_t>();
    m_source = source.data();
    return true;
  }
  m_copies.clear();
  m_numbers.clear();
  m_nodes.clear();
  m_kinds.clear();
  // The text is NUL-terminated, as the stream needs.
  rapidjson::GenericStringStream<Utf16> stream(source.data());
  DocumentBuilder builder(stream, source, m_copies, m_numbers, m_nodes, m_kinds);
  if (!RunReader<0>(stream, source.size(), skipped, builder, errorText)) {
    Reset();
    return false;
  }
  builder.Finish();
  m_source = source.data();
  return true;
}

Value Document::Ref::ToValue() const {
  using Node = detail::DocumentNode;
  const std::size_t size = m_document->m_nodes[m_index].size;
  switch (Kind()) {
  case Node::kString:
    return Value(ZelStringT<char16_t>(GetString()));
  case Node::kNumber:
    return Value(GetNumber());
  case Node::kBool:
    return Value(GetBool());
  case Node::kObject: {
    // Nesting is bounded by kMaxDepth, and so is this recursion.
    std::vector<Member> members;
    members.reserve(size);
    for (std::size_t i = 0; i < size; ++i)
      members.push_back(Member{ZelStringT<char16_t>(GetMemberName(i)), GetMember(i).ToValue()});
    return Value(Object(std::move(members)));
  }
  case Node::kArray: {
    std::vector<Value> elements;
    elements.reserve(size);
    for (std::size_t i = 0; i < size; ++i)
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
      const std::u16string_view string = GetString();
      text->GetStdString().assign(string.data(), string.size());
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
  virtual bool Members(const StringMember* members, std::size_t count) = 0;
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
  bool Members(const Writer::StringMember* members, std::size_t count) override {
    return tree.WriteMembers(members, count);
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
bool Writer::Members(const StringMember* members, std::size_t count) {
  return Check(!m_impl->failed && m_impl->Members(members, count));
}
bool Writer::Write(const Value& value) { return Check(!m_impl->failed && m_impl->Write(value)); }

ZelStringT<char16_t> Writer::Quote(std::u16string_view text) {
  std::u16string quoted(2 + 6 * text.size(), u'\0');
  quoted.resize(static_cast<std::size_t>(
      detail::WriteQuoted(text.data(), text.size(), quoted.data()) - quoted.data()));
  return ZelStringT<char16_t>(std::move(quoted));
}

void Writer::Reserve(std::size_t units) { m_impl->buffer.Expect(units); }

void Writer::ReuseStorage(ZelStringT<char16_t>& text) { m_impl->buffer.Adopt(text.GetStdString()); }

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
