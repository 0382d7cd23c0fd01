// The document reader: imports a sheet document, held as a value tree or a
// compact document, into a sheet. Used by StyleSheet's import operations.
#pragma once

namespace Styles {

class StyleSheet;

namespace detail {

class DocumentReader {
public:
  // Adds the styles of `document`, held as Access describes it, to `sheet`
  // in two passes: the first files an empty style under every name, so that
  // every "inherits" resolves when the second reads the styles. `replace`
  // decides who wins a name clash; replaced styles are destroyed once every
  // style that referred to them refers to the new one.
  template <class Access>
  static void Import(StyleSheet& sheet, const typename Access::Object& document, bool replace);
};

} // namespace detail
} // namespace Styles
