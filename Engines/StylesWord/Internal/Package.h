// ZIP packages and their relationships: opening an archive held in memory,
// reading parts with a bound on their uncompressed size, finding the styles
// and theme parts of the main document, and replacing one part. Never
// installed.
#pragma once

#include <StylesWord/WordFile.h>

#include <string>
#include <string_view>
#include <vector>

struct zip;

namespace Styles {
namespace Word {
namespace detail {

/// A package opened for reading. The bytes must outlive it.
class Package {
public:
  Package() = default;
  Package(const Package&) = delete;
  Package& operator=(const Package&) = delete;
  ~Package();

  /// False, with `error` set, when `bytes` are not a readable ZIP archive or
  /// hold more entries than the limits allow.
  bool Open(std::string_view bytes, const Limits& limits, Problem& error);
  /// Reads the part `name` (without a leading "/", letter case ignored). False,
  /// with `error` naming the part, when it is missing, damaged or too large.
  bool Read(const std::string& name, std::string& out, Problem& error) const;
  /// Whether the archive holds an entry called `name`.
  bool Has(const std::string& name) const;
  /// Every entry's name, in archive order.
  std::vector<std::string> Names() const;
  /// The name of the entry that matches `name` in any letter case.
  std::string EntryName(const std::string& name) const;

private:
  zip* m_archive = nullptr;
  Limits m_limits;
};

/// The parts a styles read needs, found through the relationships.
struct PackageParts {
  std::string styles; // empty when the main document has no styles part
  std::string theme;  // empty when it has no theme part
};

/// Follows the package relationships to the main document and from it to its
/// styles and theme parts. False, with `error` set, when there is no main
/// document or its relationships cannot be read.
bool FindParts(const Package& package, PackageParts& parts, Problem& error);

/// A copy of `bytes` with the entry `name` holding `data`; the other entries
/// keep their bytes. False, with `error` set, when the archive cannot be
/// rewritten.
bool ReplacePart(std::string_view bytes, const std::string& name, const std::string& data,
                 std::string& out, Problem& error);

} // namespace detail
} // namespace Word
} // namespace Styles
