// The property map's edits and its block; the map itself, with its lookups,
// is declared in Style.h because every style holds one.
#include <Styles/Style.h>

#include <algorithm>
#include <cstddef>
#include <new>
#include <type_traits>
#include <utility>

namespace Styles {

namespace {
static_assert(std::is_trivially_copyable<PropertyKey>::value &&
                  std::is_trivially_destructible<PropertyKey>::value,
              "keys are copied and dropped as plain words");
} // namespace

PropertyMap::~PropertyMap() {
  Clear();
  ::operator delete(m_block);
}

void PropertyMap::Clear() noexcept {
  if (!m_block)
    return;
  ZelUtils::Any* values = Values();
  for (std::size_t i = 0; i < m_block->size; ++i)
    values[i].~Any();
  m_block->size = 0;
  m_keyMask = 0;
}

void PropertyMap::Reallocate(std::size_t capacity) {
  const std::size_t bytes =
      sizeof(Block) + capacity * (sizeof(PropertyKey) + sizeof(ZelUtils::Any));
  Block* block = static_cast<Block*>(::operator new(bytes));
  block->size = static_cast<std::uint32_t>(size());
  block->capacity = static_cast<std::uint32_t>(capacity);
  PropertyKey* keys = reinterpret_cast<PropertyKey*>(block + 1);
  ZelUtils::Any* values = reinterpret_cast<ZelUtils::Any*>(keys + capacity);
  PropertyKey* oldKeys = Keys();
  ZelUtils::Any* oldValues = Values();
  for (std::size_t i = 0; i < block->size; ++i) {
    ::new (static_cast<void*>(keys + i)) PropertyKey(oldKeys[i]);
    ::new (static_cast<void*>(values + i)) ZelUtils::Any(std::move(oldValues[i]));
    oldValues[i].~Any();
  }
  ::operator delete(m_block);
  m_block = block;
}

void PropertyMap::Reserve(std::size_t count) {
  if (count > (m_block ? m_block->capacity : 0))
    Reallocate(count);
}

bool PropertyMap::Insert(const PropertyKey& key, ZelUtils::Any&& value) {
  const std::size_t count = size();
  // Documents list values in key order: appending is the usual case.
  const std::size_t i = count == 0 || Keys()[count - 1] < key ? count : LowerBound(key);
  if (i < count && Keys()[i] == key)
    return false;
  if (!m_block || count == m_block->capacity)
    Reallocate(std::max<std::size_t>(4, count * 2));
  PropertyKey* keys = Keys();
  ZelUtils::Any* values = Values();
  // Open the slot at the end, then shift it down to its place.
  ::new (static_cast<void*>(keys + count)) PropertyKey(key);
  ::new (static_cast<void*>(values + count)) ZelUtils::Any();
  for (std::size_t j = count; j > i; --j) {
    keys[j] = keys[j - 1];
    values[j] = std::move(values[j - 1]);
  }
  keys[i] = key;
  values[i] = std::move(value);
  ++m_block->size;
  m_keyMask |= MaskBit(key);
  return true;
}

bool PropertyMap::Erase(const PropertyKey& key) {
  const std::size_t count = size();
  const std::size_t i = LowerBound(key);
  if (i == count || Keys()[i] != key)
    return false;
  PropertyKey* keys = Keys();
  ZelUtils::Any* values = Values();
  for (std::size_t j = i; j + 1 < count; ++j) {
    keys[j] = keys[j + 1];
    values[j] = std::move(values[j + 1]);
  }
  values[count - 1].~Any();
  --m_block->size;
  // Other keys may share the erased key's bit.
  m_keyMask = 0;
  for (std::size_t j = 0; j + 1 < count; ++j)
    m_keyMask |= MaskBit(keys[j]);
  return true;
}

} // namespace Styles
