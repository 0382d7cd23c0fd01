/// @file
/// ZelUtils::StringPool interns UTF-16 texts: equal texts get the same entry,
/// and entries never move or die while the pool lives. PooledString<Pool> is a
/// one-word handle to an entry of the pool that Pool::Get() returns; handles
/// compare, order and hash by entry identity, never by text.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <shared_mutex>
#include <string_view>
#include <unordered_map>

namespace ZelUtils {

/// A set of interned texts; see the file overview.
class ZEL_API StringPool {
public:
  /// A pooled text, owned by the pool.
  using Entry = ZelStringT<char16_t>;

  StringPool();
  ~StringPool();
  StringPool(const StringPool&) = delete;
  StringPool& operator=(const StringPool&) = delete;

  /// The entry for `text`, inserted on first use. Safe from several threads;
  /// the returned pointer stays valid as long as the pool.
  const Entry* AddString(std::u16string_view text);
  /// The entry for `text` if the pool holds it already, else null; never
  /// inserts, so looking up names from outside cannot grow the pool.
  const Entry* FindString(std::u16string_view text) const;
  /// The entry of the empty text, without a lookup.
  const Entry* GetEmptyEntry() const noexcept { return m_empty; }
  /// The number of entries, the empty text included.
  std::size_t GetSize() const;

private:
  mutable std::shared_mutex m_mutex;
  std::deque<Entry> m_entries;                                   // a deque never moves its elements
  std::unordered_map<std::u16string_view, const Entry*> m_index; // views into m_entries
  const Entry* m_empty = nullptr;
};

/// A handle to a pooled text of Pool, whose static Get() returns a StringPool.
template <class Pool> class PooledString {
public:
  /// The handle of the empty text.
  static const PooledString Empty;

  /// The handle of the empty text.
  PooledString() noexcept : m_entry(Pool::Get().GetEmptyEntry()) {}
  ///@{

  /// The handle of `text`, which is added to the pool on first use (a null
  /// pointer is the empty text). Implicit, so that literals name keys.
  PooledString(const ZelStringT<char16_t>& text) : m_entry(Pool::Get().AddString(text)) {}
  PooledString(const char16_t* text)
      : m_entry(Pool::Get().AddString(text ? std::u16string_view(text) : std::u16string_view())) {}
  ///@}

  /// The handle of `text` when it is pooled already; nothing when it is not.
  /// Unlike the constructors it never adds to the pool.
  static std::optional<PooledString> Find(std::u16string_view text) {
    if (const ZelStringT<char16_t>* entry = Pool::Get().FindString(text))
      return PooledString(entry);
    return std::nullopt;
  }

  /// A copy of the pooled text.
  ZelStringT<char16_t> ToString() const { return *m_entry; }
  /// The pooled text itself; valid as long as the pool.
  const ZelStringT<char16_t>& GetString() const noexcept { return *m_entry; }
  /// A view of the pooled text; valid as long as the pool.
  std::u16string_view GetView() const noexcept { return m_entry->GetView(); }
  /// A hash of the entry's identity, not of its text.
  std::size_t getHash() const noexcept { return std::hash<const void*>()(m_entry); }

  ///@{

  /// Equal exactly when the texts are equal, since each text has one entry.
  friend bool operator==(PooledString a, PooledString b) noexcept { return a.m_entry == b.m_entry; }
  friend bool operator!=(PooledString a, PooledString b) noexcept { return a.m_entry != b.m_entry; }
  ///@}

  ///@{

  /// Identity order: the order of the entries' addresses, not of the texts.
  friend bool operator<(PooledString a, PooledString b) noexcept {
    return std::less<const void*>()(a.m_entry, b.m_entry);
  }
  friend bool operator>(PooledString a, PooledString b) noexcept { return b < a; }
  friend bool operator<=(PooledString a, PooledString b) noexcept { return !(b < a); }
  friend bool operator>=(PooledString a, PooledString b) noexcept { return !(a < b); }
  ///@}

private:
  explicit PooledString(const ZelStringT<char16_t>* entry) noexcept : m_entry(entry) {}

  const ZelStringT<char16_t>* m_entry;
};

} // namespace ZelUtils

/// Hashes keys by identity, so that they can key unordered containers.
template <class Pool> struct std::hash<ZelUtils::PooledString<Pool>> {
  /// PooledString::getHash of the key.
  std::size_t operator()(ZelUtils::PooledString<Pool> key) const noexcept { return key.getHash(); }
};
