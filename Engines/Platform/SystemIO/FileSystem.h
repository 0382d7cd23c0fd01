/// @file
/// SystemIO::File and SystemIO::Directory: the few file-system operations that
/// crash-safe saving needs (replacing a file in one step, removing a file) and
/// the listing of a folder. Paths are UTF-16 text, as in SystemIO::Path.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

#include <vector>

namespace SystemIO {

/// Operations on single files.
struct ZEL_API File {
  /// Renames `source` to `target`, replacing a file already called `target`
  /// in one step: at every instant `target` names either the old file or the
  /// new one. Both must lie in one folder (one file system at least). Then
  /// flushes the folder so that the rename survives a system crash (best
  /// effort). False, with nothing changed, when the rename fails: a path that
  /// cannot name a file, a missing `source`, a `target` that is a folder.
  static bool Replace(const ZelStringT<char16_t>& source, const ZelStringT<char16_t>& target);
  /// Removes the file `path` (a link itself, not what it points to). False
  /// when there is no such file, it is a folder, or it cannot be removed.
  static bool Remove(const ZelStringT<char16_t>& path);
};

/// Operations on folders.
struct ZEL_API Directory {
  /// The names (not paths) of the regular files in `folder`, links to regular
  /// files included, sorted by code unit. Names that are not valid UTF-8 are
  /// left out, since no UTF-16 path could name them. Empty when the folder
  /// cannot be read.
  static std::vector<ZelStringT<char16_t>> GetFileNames(const ZelStringT<char16_t>& folder);
};

} // namespace SystemIO
