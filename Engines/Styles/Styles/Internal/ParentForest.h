// The parent forest: the parent links of the styles one import touches, kept
// so that refusing a link that would close a parent cycle stays cheap however
// long the chains. Used by the sheet while the document reader runs.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace Styles {

class Style;

namespace detail {

// A forest whose paths are kept in splay trees (a link-cut forest), so that
// whether a new link would close a cycle takes amortised logarithmic time,
// and constant time for the shapes real documents have. A style enters the
// forest, with its whole chain, the first time it is to be a parent; a child
// that is not in it cannot be an ancestor of anything and is linked at once.
// The forest stays exact as long as parent links change only through it
// while the import runs.
class ParentForest {
public:
  // Whether `child` may inherit from `parent` (false when `child` is `parent`
  // or one of its ancestors); when it may, the new link is recorded.
  bool Link(const Style* child, const Style* parent);

  // The style whose members the import reads; any other child is inside a
  // style's tree, and only such links can lead back to the style holding them.
  void SetReading(const Style* style) noexcept { m_reading = style; }
  bool SubstyleLinked() const noexcept { return m_substyleLinked; }

private:
  static constexpr std::uint32_t kNone = ~std::uint32_t(0);
  struct Node {
    std::uint32_t child[2] = {kNone, kNone};
    std::uint32_t up = kNone; // parent in the splay tree, else the path's parent
  };
  struct Slot {
    const Style* style = nullptr;
    std::uint32_t node = kNone;
  };

  std::uint32_t Find(const Style* style) const;
  // Files `node` as the node of `style`, which has none yet.
  void Index(const Style* style, std::uint32_t node);
  void Place(const Slot& slot);
  std::size_t Hash(const Style* style) const;
  // The node of `style`, made with those of its ancestors when missing.
  std::uint32_t Load(const Style* style);
  bool IsSplayRoot(std::uint32_t x) const;
  void Rotate(std::uint32_t x);
  void Splay(std::uint32_t x);
  // Makes the path from x's root down to x one splay tree, rooted at x.
  void Access(std::uint32_t x);
  std::uint32_t FindRoot(std::uint32_t x);
  // Links the root x below `parent`.
  void Attach(std::uint32_t x, std::uint32_t parent);
  // Cuts x from its parent, if it has one.
  void Cut(std::uint32_t x);

  std::vector<Node> m_nodes;
  // Each style's node, by open addressing on the style's address.
  std::vector<Slot> m_slots;
  std::vector<const Style*> m_chain; // scratch of Load
  const Style* m_reading = nullptr;
  bool m_substyleLinked = false;
};

} // namespace detail
} // namespace Styles
