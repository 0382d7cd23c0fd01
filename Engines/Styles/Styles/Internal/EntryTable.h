// The entry table: an open-addressing hash table of pointers to entries,
// keyed by what a key functor reads from an entry. The name index keeps two
// of them, one by folded name and one by style.
#pragma once

#include <cstddef>
#include <utility>
#include <vector>

namespace Styles {
namespace detail {

// An open-addressing table of index entries keyed by what KeyOf reads from an
// entry: linear probing in a power-of-two array, deletion by shifting back,
// so a lookup touches one or two cache lines instead of a chain of nodes.
template <class Entry, class KeyOf> class EntryTable {
public:
  using Key = decltype(KeyOf()(std::declval<const Entry&>()));

  std::size_t Size() const noexcept { return m_count; }
  Entry* Find(const Key& key, std::size_t hash) const {
    if (m_slots.empty())
      return nullptr;
    for (std::size_t i = hash & Mask();; i = (i + 1) & Mask()) {
      const Slot& slot = m_slots[i];
      if (!slot.entry)
        return nullptr;
      if (slot.hash == hash && KeyOf()(*slot.entry) == key)
        return slot.entry;
    }
  }
  // Adds `entry`, whose key must not be in the table yet.
  void Insert(Entry* entry, std::size_t hash) {
    Reserve(m_count + 1);
    std::size_t i = hash & Mask();
    while (m_slots[i].entry)
      i = (i + 1) & Mask();
    m_slots[i] = Slot{hash, entry};
    ++m_count;
  }
  void Erase(const Entry* entry, std::size_t hash) {
    std::size_t i = hash & Mask();
    while (m_slots[i].entry != entry)
      i = (i + 1) & Mask();
    // Shift back the entries that probed past the freed slot.
    for (std::size_t j = (i + 1) & Mask(); m_slots[j].entry; j = (j + 1) & Mask()) {
      const std::size_t home = m_slots[j].hash & Mask();
      if (((j - home) & Mask()) >= ((j - i) & Mask())) {
        m_slots[i] = m_slots[j];
        i = j;
      }
    }
    m_slots[i] = Slot{};
    --m_count;
  }
  // Room for `count` entries at a load of at most three quarters.
  void Reserve(std::size_t count) {
    if (count * 4 <= m_slots.size() * 3)
      return;
    std::size_t capacity = 16;
    while (capacity * 3 < count * 4)
      capacity *= 2;
    std::vector<Slot> slots(capacity);
    slots.swap(m_slots);
    for (const Slot& slot : slots) {
      if (!slot.entry)
        continue;
      std::size_t i = slot.hash & Mask();
      while (m_slots[i].entry)
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
    std::size_t hash = 0;
    Entry* entry = nullptr;
  };
  std::size_t Mask() const noexcept { return m_slots.size() - 1; }

  std::vector<Slot> m_slots;
  std::size_t m_count = 0;
};

} // namespace detail
} // namespace Styles
