// The document writer: a sheet's JSON document, built as a value tree or
// written straight as text. Used by StyleSheet's export operations.
#pragma once

#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>

namespace Styles {
namespace detail {

class DocumentWriter {
public:
  // Adds the document's members to the Json::Object that `out` holds.
  static void WriteTree(const StyleSheet& sheet, JsonValue& out, bool includeTemporary);
  // Replaces `text` with the document, the same text the tree would give.
  static void WriteText(const StyleSheet& sheet, ZelStringT<char16_t>& text, bool includeTemporary);
};

} // namespace detail
} // namespace Styles
