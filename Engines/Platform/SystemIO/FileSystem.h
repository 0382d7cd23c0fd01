/// @file
/// SystemIO::File and SystemIO::Directory: the few file-system operations that
/// preset folders need (guarded reading, moving a file aside)
/// and the listing of a folder. Paths are UTF-16 text, as in SystemIO::Path.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <string>
#include <vector>

namespace SystemIO {

/// Operations on single files.
struct ZEL_API File {
  /// Renames `source` to `target` inside one file system, never replacing
  /// anything: false, with nothing changed, when `target` exists (a dangling
  /// link included), `source` is missing, or a path cannot name a file.
  static bool MoveAside(const ZelStringT<char16_t>& source, const ZelStringT<char16_t>& target);
  /// Whether anything is called `path`: a file, a folder, a link (even one
  /// that leads nowhere).
  static bool Exists(const ZelStringT<char16_t>& path);
  /// Reads the whole of `path` into `bytes` when it is a regular file (or a
  /// link to one) of at most `maxBytes` bytes. The check is made on the opened
  /// file, so a file swapped in after a check cannot be read by mistake; pipes,
  /// devices and folders are refused without reading a byte or waiting. False,
  /// with `bytes` empty and the reason (strerror-style text) in `error`, when
  /// the file is missing, refused, too large or cannot be read.
  static bool ReadRegular(const ZelStringT<char16_t>& path, std::size_t maxBytes,
                          std::string& bytes, std::string* error = nullptr);
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
