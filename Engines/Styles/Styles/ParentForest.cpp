// The parent forest's splay trees and its table of styles by address; the
// sheet consults it while the document reader runs.
#include <Styles/Internal/ParentForest.h>

#include <Styles/Style.h>

#include <algorithm>

namespace Styles {
namespace detail {

bool ParentForest::Link(const Style* child, const Style* parent) {
  if (child != m_reading)
    m_substyleLinked = true;
  if (child == parent)
    return false;
  const std::uint32_t above = Load(parent);
  const std::uint32_t node = Find(child);
  if (node == kNone)
    return true;
  Cut(node);
  if (FindRoot(above) == node) {
    if (const Style* current = child->GetParent())
      Attach(node, Find(current));
    return false;
  }
  Attach(node, above);
  return true;
}

std::uint32_t ParentForest::Find(const Style* style) const {
  if (m_slots.empty())
    return kNone;
  for (std::size_t i = Hash(style);; i = (i + 1) & (m_slots.size() - 1)) {
    if (!m_slots[i].style)
      return kNone;
    if (m_slots[i].style == style)
      return m_slots[i].node;
  }
}

void ParentForest::Index(const Style* style, std::uint32_t node) {
  if ((m_nodes.size() + 1) * 2 > m_slots.size()) {
    std::vector<Slot> slots(std::max<std::size_t>(64, m_slots.size() * 2));
    slots.swap(m_slots);
    for (const Slot& slot : slots)
      if (slot.style)
        Place(slot);
  }
  Place(Slot{style, node});
}

void ParentForest::Place(const Slot& slot) {
  std::size_t i = Hash(slot.style);
  while (m_slots[i].style)
    i = (i + 1) & (m_slots.size() - 1);
  m_slots[i] = slot;
}

std::size_t ParentForest::Hash(const Style* style) const {
  return static_cast<std::size_t>((reinterpret_cast<std::uintptr_t>(style) >> 4) *
                                  0x9E3779B97F4A7C15ull) &
         (m_slots.size() - 1);
}

std::uint32_t ParentForest::Load(const Style* style) {
  std::uint32_t above = Find(style);
  if (above != kNone)
    return above;
  m_chain.clear();
  for (const Style* ancestor = style; ancestor; ancestor = ancestor->GetParent()) {
    if ((above = Find(ancestor)) != kNone)
      break;
    m_chain.push_back(ancestor);
  }
  for (auto it = m_chain.rbegin(); it != m_chain.rend(); ++it) {
    const auto node = static_cast<std::uint32_t>(m_nodes.size());
    Index(*it, node);
    m_nodes.emplace_back();
    if (above != kNone)
      Attach(node, above);
    above = node;
  }
  return above;
}

bool ParentForest::IsSplayRoot(std::uint32_t x) const {
  const std::uint32_t up = m_nodes[x].up;
  return up == kNone || (m_nodes[up].child[0] != x && m_nodes[up].child[1] != x);
}

void ParentForest::Rotate(std::uint32_t x) {
  const std::uint32_t y = m_nodes[x].up;
  const std::uint32_t z = m_nodes[y].up;
  const int side = m_nodes[y].child[1] == x ? 1 : 0;
  if (!IsSplayRoot(y))
    m_nodes[z].child[m_nodes[z].child[1] == y ? 1 : 0] = x;
  m_nodes[x].up = z;
  const std::uint32_t moved = m_nodes[x].child[1 - side];
  m_nodes[y].child[side] = moved;
  if (moved != kNone)
    m_nodes[moved].up = y;
  m_nodes[x].child[1 - side] = y;
  m_nodes[y].up = x;
}

void ParentForest::Splay(std::uint32_t x) {
  while (!IsSplayRoot(x)) {
    const std::uint32_t y = m_nodes[x].up;
    if (!IsSplayRoot(y)) {
      const std::uint32_t z = m_nodes[y].up;
      const bool sameSide = (m_nodes[z].child[0] == y) == (m_nodes[y].child[0] == x);
      Rotate(sameSide ? y : x);
    }
    Rotate(x);
  }
}

void ParentForest::Access(std::uint32_t x) {
  std::uint32_t below = kNone;
  for (std::uint32_t y = x; y != kNone; y = m_nodes[y].up) {
    Splay(y);
    m_nodes[y].child[1] = below;
    below = y;
  }
  Splay(x);
}

std::uint32_t ParentForest::FindRoot(std::uint32_t x) {
  Access(x);
  while (m_nodes[x].child[0] != kNone)
    x = m_nodes[x].child[0];
  Splay(x);
  return x;
}

void ParentForest::Attach(std::uint32_t x, std::uint32_t parent) {
  Access(x);
  m_nodes[x].up = parent;
}

void ParentForest::Cut(std::uint32_t x) {
  Access(x);
  const std::uint32_t above = m_nodes[x].child[0];
  if (above != kNone) {
    m_nodes[above].up = kNone;
    m_nodes[x].child[0] = kNone;
  }
}

} // namespace detail
} // namespace Styles
