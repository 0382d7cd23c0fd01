/// @file
/// SystemIO::Path: operations on file paths held as UTF-16 text, with "/" as
/// the folder separator.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

namespace SystemIO {

/// Operations on paths; nothing touches the file system.
struct ZEL_API Path {
  /// `name` inside `folder`: the two joined by one "/" (none is added when
  /// `folder` already ends in "/"). An absolute `name` (starting with "/") or
  /// an empty `folder` gives `name`; an empty `name` gives `folder`.
  static ZelStringT<char16_t> Combine(const ZelStringT<char16_t>& folder,
                                      const ZelStringT<char16_t>& name);
};

} // namespace SystemIO
