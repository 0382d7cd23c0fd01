/// @file
/// Json: the platform's JSON value model and its text form. A Value is one of
/// null, UTF-16 string, Object, number (double), bool, Array or UTF-8 string.
/// Objects keep their members in insertion order and allow repeated names.
/// Parse reads UTF-16 JSON text into a Value; ValueToString writes one back, so
/// that Parse(ValueToString(v, format)) gives v again for either format.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Variant.h>

#include <cassert>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

namespace Json {

/// Parse rejects text whose objects and arrays nest deeper than this; the
/// limit bounds the work and the stack needed by anything that walks a parsed
/// value recursively.
constexpr int kMaxDepth = 512;

/// The JSON null; all nulls are equal.
struct NullType {
  friend bool operator==(NullType, NullType) noexcept { return true; }
  friend bool operator!=(NullType, NullType) noexcept { return false; }
};

class Value;
struct Member;

/// A JSON object: (name, value) members in insertion order. Repeated names are
/// kept; Find returns the first. Equality compares members in order.
class Object {
public:
  ///@{

  /// Iterator over the members, in order.
  using iterator = std::vector<Member>::iterator;
  using const_iterator = std::vector<Member>::const_iterator;
  ///@}

  Object() noexcept;
  ///@{

  /// Copies every member deeply; a moved-from object is left empty.
  Object(const Object& other);
  Object(Object&& other) noexcept;
  Object& operator=(const Object& other);
  Object& operator=(Object&& other) noexcept;
  ///@}
  ~Object();

  /// Takes the members as they are, in their order.
  explicit Object(std::vector<Member>&& members) noexcept;

  ///@{

  /// The number of members, repeated names included.
  std::size_t GetSize() const noexcept;
  bool IsEmpty() const noexcept;
  ///@}

  ///@{

  /// Name and value of member i; i must be below GetSize().
  const ZelStringT<char16_t>& GetValueName(std::size_t i) const;
  const Value& GetValue(std::size_t i) const;
  Value& GetValue(std::size_t i);
  ///@}

  /// Appends a member after the existing ones, even when the name is taken.
  void AddValue(ZelStringT<char16_t> name, Value value);
  /// Makes room for `count` members in all: a hint, never needed.
  void Reserve(std::size_t count);
  ///@{

  /// The value of the first member called name, or null; not owned.
  const Value* Find(std::u16string_view name) const noexcept;
  Value* Find(std::u16string_view name) noexcept;
  ///@}

  ///@{

  /// The members in order, as Member structures.
  iterator begin() noexcept;
  iterator end() noexcept;
  const_iterator begin() const noexcept;
  const_iterator end() const noexcept;
  ///@}

  friend bool operator==(const Object& a, const Object& b);
  friend bool operator!=(const Object& a, const Object& b);

private:
  std::vector<Member> m_members;
};

/// A JSON array: values in order. Equality compares element by element.
class Array {
public:
  ///@{

  /// Iterator over the values, in order.
  using iterator = std::vector<Value>::iterator;
  using const_iterator = std::vector<Value>::const_iterator;
  ///@}

  Array() noexcept;
  ///@{

  /// Copies every value deeply; a moved-from array is left empty.
  Array(const Array& other);
  Array(Array&& other) noexcept;
  Array& operator=(const Array& other);
  Array& operator=(Array&& other) noexcept;
  ///@}
  ~Array();

  /// Takes the values as they are, in their order.
  explicit Array(std::vector<Value>&& values) noexcept;

  ///@{

  /// The number of values.
  std::size_t GetSize() const noexcept;
  bool IsEmpty() const noexcept;
  ///@}

  ///@{

  /// Value i; i must be below GetSize().
  const Value& GetValue(std::size_t i) const;
  Value& GetValue(std::size_t i);
  ///@}

  /// Appends `value` after the existing ones.
  void AddValue(Value value);
  /// Makes room for `count` values in all: a hint, never needed.
  void Reserve(std::size_t count);

  ///@{

  /// The values in order.
  iterator begin() noexcept;
  iterator end() noexcept;
  const_iterator begin() const noexcept;
  const_iterator end() const noexcept;
  ///@}

  friend bool operator==(const Array& a, const Array& b);
  friend bool operator!=(const Array& a, const Array& b);

private:
  std::vector<Value> m_values;
};

namespace detail {
template <class T>
constexpr bool kIsNumber =
    std::is_arithmetic<T>::value && !std::is_same<T, bool>::value &&
    !std::is_same<T, char>::value && !std::is_same<T, signed char>::value &&
    !std::is_same<T, unsigned char>::value && !std::is_same<T, wchar_t>::value &&
    !std::is_same<T, char16_t>::value && !std::is_same<T, char32_t>::value;
} // namespace detail

/// The kinds a Value can hold, in their Index() order.
using ValueBase = ZelUtils::Variant<NullType, ZelStringT<char16_t>, Object, double, bool, Array,
                                    ZelStringT<char>>;

/// One JSON value; a default-constructed value is null. Every number is held as
/// a double. ZelStringT<char> holds UTF-8 text and is written as a string.
/// Get<T>() throws std::bad_cast when another kind is held.
class Value : public ValueBase {
public:
  Value() = default;
  /// The null value.
  Value(NullType) noexcept {}
  Value(std::nullptr_t) = delete;
  ///@{

  /// Holds the text, object or array; implicit, so that values read like JSON.
  Value(const char16_t* text) : ValueBase(ZelStringT<char16_t>(text)) {}
  Value(ZelStringT<char16_t> text) noexcept : ValueBase(std::move(text)) {}
  Value(ZelStringT<char> utf8Text) noexcept : ValueBase(std::move(utf8Text)) {}
  Value(Object object) noexcept : ValueBase(std::move(object)) {}
  Value(Array array) noexcept : ValueBase(std::move(array)) {}
  ///@}

  /// Any integer or floating-point number becomes a double.
  template <class T, std::enable_if_t<detail::kIsNumber<T>, int> = 0>
  Value(T number) noexcept : ValueBase(static_cast<double>(number)) {}
  /// Only a real bool; pointers and numbers never turn into one.
  template <class T, std::enable_if_t<std::is_same<T, bool>::value, int> = 0>
  Value(T flag) noexcept : ValueBase(flag) {}

  /// True for the null value.
  bool IsNull() const noexcept { return Is<NullType>(); }
};

/// One member of an Object.
struct Member {
  ZelStringT<char16_t> name; ///< The member's name, as written.
  Value value;               ///< The member's value.

  friend bool operator==(const Member& a, const Member& b) {
    return a.name == b.name && a.value == b.value;
  }
  friend bool operator!=(const Member& a, const Member& b) { return !(a == b); }
};

/// Parses the whole of text as one JSON value into out. Returns false for text
/// that is not exactly one valid JSON value (trailing text, unpaired surrogates,
/// nesting deeper than kMaxDepth, a number too big for a double); then out is
/// unchanged and errorText holds a message with the offset in code units. Does
/// not throw for bad text. Numbers are correctly rounded; one too small for a
/// double becomes zero of its sign. A leading byte order mark (U+FEFF) is
/// skipped. On success errorText is cleared.
ZEL_API bool Parse(const ZelStringT<char16_t>& text, Value& out, ZelStringT<char16_t>& errorText);

/// The JSON text of value: compact when format is false, indented by two spaces
/// per level when true. Numbers are written in the shortest form that reads back
/// to the same double (integers without fraction, -0 as "-0.0"); NaN and
/// infinities are written as null; unpaired surrogates in strings become
/// U+FFFD and invalid UTF-8 in ZelStringT<char> values does too. Returns an
/// empty string if the text cannot be produced.
ZEL_API ZelStringT<char16_t> ValueToString(const Value& value, bool format);

namespace detail {
// One value of a Document, or the name of an object member. Its kind is kept
// apart, one byte a node, so that a node is two words of 32 bits.
struct DocumentNode {
  enum Kind : std::uint8_t { kNull, kString, kNumber, kBool, kObject, kArray, kName };
  // Set on the kind of a string or name whose decoded text differs from the
  // text it was read from (it had escapes) and so is kept in a side buffer.
  static constexpr std::uint8_t kCopied = 0x80;
  std::uint32_t size; // a string's or name's length; an object's members, an array's elements
  // A string's or name's offset into its text, a number's index, a bool's
  // flag, or a container's first child: members come as name, value pairs.
  std::uint32_t payload;
};
} // namespace detail

/// A JSON text parsed once into a compact, read-only form: the values sit in
/// one array of two-word nodes and the strings point into the text itself
/// (those with escapes into one side buffer), so reading even a large text
/// takes a handful of allocations instead of several per value. Parse accepts
/// and rejects exactly what Json::Parse does, with the same messages; ToValue
/// turns any part into an ordinary Value.
class ZEL_API Document {
  using Node = detail::DocumentNode;

public:
  /// A value inside a document; valid while the document lives unchanged
  /// (and, after ParseBorrowed, while its text does).
  class Ref {
  public:
    ///@{

    /// The kind of the value.
    bool IsNull() const noexcept { return Kind() == Node::kNull; }
    bool IsString() const noexcept { return Kind() == Node::kString; }
    bool IsNumber() const noexcept { return Kind() == Node::kNumber; }
    bool IsBool() const noexcept { return Kind() == Node::kBool; }
    bool IsObject() const noexcept { return Kind() == Node::kObject; }
    bool IsArray() const noexcept { return Kind() == Node::kArray; }
    ///@}

    /// The text of a string; empty for other kinds.
    std::u16string_view GetString() const noexcept {
      return IsString() ? m_document->TextOf(m_index) : std::u16string_view();
    }
    /// The number; 0 for other kinds.
    double GetNumber() const noexcept {
      return IsNumber() ? m_document->m_numbers[m_document->m_nodes[m_index].payload] : 0.0;
    }
    /// The flag; false for other kinds.
    bool GetBool() const noexcept { return IsBool() && m_document->m_nodes[m_index].payload; }
    /// The number of members of an object or elements of an array; else 0.
    std::size_t GetSize() const noexcept {
      return IsObject() || IsArray() ? m_document->m_nodes[m_index].size : 0;
    }
    ///@{

    /// Member i of an object (i below GetSize()).
    std::u16string_view GetMemberName(std::size_t i) const noexcept {
      return m_document->TextOf(First() + 2 * i);
    }
    Ref GetMember(std::size_t i) const noexcept { return Ref(m_document, First() + 2 * i + 1); }
    ///@}

    /// Element i of an array (i below GetSize()).
    Ref GetElement(std::size_t i) const noexcept { return Ref(m_document, First() + i); }
    /// An owning copy of this value and everything in it.
    ZEL_API Value ToValue() const;
    /// Makes `out` this value, reusing the storage of a string it holds.
    ZEL_API void AssignTo(Value& out) const;

  private:
    friend class Document;
    Ref(const Document* document, std::size_t index) noexcept
        : m_document(document), m_index(index) {}
    std::uint8_t Kind() const noexcept { return m_document->m_kinds[m_index] & ~Node::kCopied; }
    std::size_t First() const noexcept { return m_document->m_nodes[m_index].payload; }

    const Document* m_document;
    std::size_t m_index;
  };

  Document();
  ~Document();
  Document(const Document&) = delete;
  Document& operator=(const Document&) = delete;

  /// Parses the whole of `text`, which the document copies; on failure the
  /// document is empty (its root is null) and `errorText` says why, as
  /// Json::Parse would.
  bool Parse(const ZelStringT<char16_t>& text, ZelStringT<char16_t>& errorText);
  /// The same without a copy: the document reads its strings from `text`,
  /// which must outlive the document and stay unchanged.
  bool ParseBorrowed(const ZelStringT<char16_t>& text, ZelStringT<char16_t>& errorText);
  /// The parsed value; null before a successful Parse.
  Ref GetRoot() const noexcept { return Ref(this, m_nodes.size() - 1); }

private:
  std::u16string_view TextOf(std::size_t index) const noexcept {
    const Node& node = m_nodes[index];
    const char16_t* base = m_kinds[index] & Node::kCopied ? m_copies.data() : m_source;
    return std::u16string_view(base + node.payload, node.size);
  }
  void Reset();
  // Parses `text`, which is NUL-terminated and outlives the document.
  bool Read(std::u16string_view text, ZelStringT<char16_t>& errorText);

  std::u16string m_owned;            // the text, when Parse copied it
  const char16_t* m_source;          // the parsed text, after a byte order mark
  std::u16string m_copies;           // the decoded strings that had escapes
  std::vector<double> m_numbers;     // the numbers, in text order
  std::vector<Node> m_nodes;         // children before parents; the root last
  std::vector<std::uint8_t> m_kinds; // the kind of each node
};

/// Writes JSON text piece by piece, in the layouts of ValueToString, without
/// building a value tree first: a sheet writes its document through it. Each
/// call returns false once any piece has failed; the text is then lost.
class ZEL_API Writer {
public:
  /// Compact text, or indented by two spaces per level when `format` is true.
  explicit Writer(bool format);
  ~Writer();
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;

  ///@{

  /// Opens or closes an object or an array.
  bool StartObject();
  bool EndObject();
  bool StartArray();
  bool EndArray();
  ///@}

  /// A member name; the member's value follows.
  bool Key(std::u16string_view name);
  /// A string value.
  bool String(std::u16string_view text);
  /// A member whose value is a string: the text of Key(name) then String(text).
  bool Member(std::u16string_view name, std::u16string_view text);
  /// A member name and its string value, for Members.
  struct StringMember {
    std::u16string_view name; ///< The member's name.
    std::u16string_view text; ///< Its string value.
    /// Empty, or Quote(name): then the compact layout copies it as the name
    /// instead of escaping the name again.
    std::u16string_view quotedName = {};
  };
  /// `count` members in order, each as Member writes it, in one call.
  bool Members(const StringMember* members, std::size_t count);
  /// `text` as a JSON string: quoted and escaped, unpaired surrogates U+FFFD.
  static ZelStringT<char16_t> Quote(std::u16string_view text);
  /// A whole value, containers included, as ValueToString writes it.
  bool Write(const Value& value);
  /// Makes room for `units` more UTF-16 units of text: a hint, never needed.
  void Reserve(std::size_t units);
  /// Writes into the memory `text` holds, which it empties, so that text
  /// written again and again into one string reuses it; TakeText hands it
  /// back. Only before the first piece; later it does nothing.
  void ReuseStorage(ZelStringT<char16_t>& text);
  /// The text once every container is closed; empty when a piece failed or
  /// the text is incomplete.
  ZelStringT<char16_t> TakeText();

  struct Impl;

private:
  bool Check(bool written);

  std::unique_ptr<Impl> m_impl;
};

// Inline definitions that need Value and Member complete.

inline Object::Object() noexcept = default;
inline Object::Object(const Object& other) = default;
inline Object::Object(Object&& other) noexcept = default;
inline Object& Object::operator=(const Object& other) = default;
inline Object& Object::operator=(Object&& other) noexcept = default;
inline Object::~Object() = default;
inline Object::Object(std::vector<Member>&& members) noexcept : m_members(std::move(members)) {}

inline std::size_t Object::GetSize() const noexcept { return m_members.size(); }
inline bool Object::IsEmpty() const noexcept { return m_members.empty(); }
inline const ZelStringT<char16_t>& Object::GetValueName(std::size_t i) const {
  assert(i < m_members.size());
  return m_members[i].name;
}
inline const Value& Object::GetValue(std::size_t i) const {
  assert(i < m_members.size());
  return m_members[i].value;
}
inline Value& Object::GetValue(std::size_t i) {
  assert(i < m_members.size());
  return m_members[i].value;
}
inline void Object::AddValue(ZelStringT<char16_t> name, Value value) {
  m_members.push_back(Member{std::move(name), std::move(value)});
}
inline void Object::Reserve(std::size_t count) { m_members.reserve(count); }
inline const Value* Object::Find(std::u16string_view name) const noexcept {
  for (const Member& member : m_members)
    if (member.name.GetView() == name)
      return &member.value;
  return nullptr;
}
inline Value* Object::Find(std::u16string_view name) noexcept {
  return const_cast<Value*>(static_cast<const Object&>(*this).Find(name));
}
inline Object::iterator Object::begin() noexcept { return m_members.begin(); }
inline Object::iterator Object::end() noexcept { return m_members.end(); }
inline Object::const_iterator Object::begin() const noexcept { return m_members.begin(); }
inline Object::const_iterator Object::end() const noexcept { return m_members.end(); }
///@{

/// Equal when the members are equal one by one, in order.
inline bool operator==(const Object& a, const Object& b) { return a.m_members == b.m_members; }
inline bool operator!=(const Object& a, const Object& b) { return !(a == b); }
///@}

inline Array::Array() noexcept = default;
inline Array::Array(const Array& other) = default;
inline Array::Array(Array&& other) noexcept = default;
inline Array& Array::operator=(const Array& other) = default;
inline Array& Array::operator=(Array&& other) noexcept = default;
inline Array::~Array() = default;
inline Array::Array(std::vector<Value>&& values) noexcept : m_values(std::move(values)) {}

inline std::size_t Array::GetSize() const noexcept { return m_values.size(); }
inline bool Array::IsEmpty() const noexcept { return m_values.empty(); }
inline const Value& Array::GetValue(std::size_t i) const {
  assert(i < m_values.size());
  return m_values[i];
}
inline Value& Array::GetValue(std::size_t i) {
  assert(i < m_values.size());
  return m_values[i];
}
inline void Array::AddValue(Value value) { m_values.push_back(std::move(value)); }
inline void Array::Reserve(std::size_t count) { m_values.reserve(count); }
inline Array::iterator Array::begin() noexcept { return m_values.begin(); }
inline Array::iterator Array::end() noexcept { return m_values.end(); }
inline Array::const_iterator Array::begin() const noexcept { return m_values.begin(); }
inline Array::const_iterator Array::end() const noexcept { return m_values.end(); }
///@{

/// Equal when the values are equal one by one, in order.
inline bool operator==(const Array& a, const Array& b) { return a.m_values == b.m_values; }
inline bool operator!=(const Array& a, const Array& b) { return !(a == b); }
///@}

} // namespace Json
