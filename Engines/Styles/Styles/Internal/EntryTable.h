// The entry table: an open-addressing hash table of index entries, keyed by
// what a key functor reads from an entry. The name index keeps two of them,
// one by folded name and one by style.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <utility>
#include <vector>

namespace Styles {
namespace detail {

// An open-addressing table of entries of one deque, keyed by what KeyOf reads
// from an entry: linear probing in a power-of-two array, deletion by shifting
// back. A slot is two 32-bit words, a hash and the entry's position in the
// deque (each entry knows its own as `position`), so a lookup touches one
// cache line of slots for several probes and a large table stays small.
template <class Entry, class KeyOf> class EntryTable {
public:
  using Key = decltype(KeyOf()(std::declval<const Entry&>()));

  explicit EntryTable(std::deque<Entry>& entries) : m_entries(entries) {}
  EntryTable(const EntryTable&) = delete;
  EntryTable& operator=(const EntryTable&) = delete;

  std::size_t Size() const noexcept { return m_count; }
  Entry* Find(const Key& key, std::size_t hash) const {
    if (m_slots.empty())
      return nullptr;
    const auto tag = static_cast<std::uint32_t>(hash);
    for (std::size_t i = hash & Mask();; i = (i + 1) & Mask()) {
      const Slot& slot = m_slots[i];
      if (!slot.taken)
        return nullptr;
      if (slot.hash == tag) {
        Entry& entry = m_entries[slot.taken - 1];
        if (KeyOf()(entry) == key)
          return &entry;
      }
    }
  }
  // Adds `entry`, whose key must not be in the table yet.
  void Insert(const Entry* entry, std::size_t hash) {
    Reserve(m_count + 1);
    std::size_t i = hash & Mask();
    while (m_slots[i].taken)
      i = (i + 1) & Mask();
    m_slots[i] = Slot{static_cast<std::uint32_t>(hash), entry->position + 1};
    ++m_count;
  }
  void Erase(const Entry* entry, std::size_t hash) {
    const std::uint32_t taken = entry->position + 1;
    std::size_t i = hash & Mask();
    while (m_slots[i].taken != taken)
      i = (i + 1) & Mask();
    // Shift back the entries that probed past the freed slot.
    for (std::size_t j = (i + 1) & Mask(); m_slots[j].taken; j = (j + 1) & Mask()) {
      const std::size_t home = m_slots[j].hash & Mask();
      if (((j - home) & Mask()) >= ((j - i) & Mask())) {
        m_slots[i] = m_slots[j];
        i = j;
      }
    }
    m_slots[i] = Slot{};
    --m_count;
  }
  // Room for `count` entries at a load of at most four fifths.
  void Reserve(std::size_t count) {
    if (count * 5 <= m_slots.size() * 4)
      return;
    std::size_t capacity = 16;
    while (capacity * 4 < count * 5)
      capacity *= 2;
    std::vector<Slot> slots(capacity);
    slots.swap(m_slots);
    for (const Slot& slot : slots) {
      if (!slot.taken)
        continue;
      std::size_t i = slot.hash & Mask();
      while (m_slots[i].taken)
        i = (i + 1) & Mask();
      m_slots[i] = slot;
    }
  }
  void Clear() noexcept {
    m_slots.clear();
    m_count = 0;
  }

private:
  struct Slot {
    std::uint32_t hash = 0;  // the low half of the entry's hash
    std::uint32_t taken = 0; // the entry's position plus one; 0 for a free slot
  };
  std::size_t Mask() const noexcept { return m_slots.size() - 1; }

  std::deque<Entry>& m_entries;
  std::vector<Slot> m_slots;
  std::size_t m_count = 0;
};

} // namespace detail
} // namespace Styles
