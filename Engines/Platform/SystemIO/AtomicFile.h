/// @file
/// SystemIO::AtomicFile and SystemIO::WriteFileAtomically: replacing a file's
/// bytes so that, whenever the process or the system stops, the file holds
/// either its old bytes or the new ones, and nothing else is left behind
/// that outlives the next write into the same folder. Paths are UTF-8 text.
#pragma once

#include <ZelPlatform/Export.h>

#include <string>
#include <string_view>

namespace SystemIO {

/// A file written beside its final place and put there in one step.
///
/// On Linux the new bytes go to an unnamed file of the target's folder
/// (`O_TMPFILE`), so a crash while writing leaves nothing. The file gets a
/// name only for the instant between linking it in and renaming it over the
/// target; elsewhere it is named from the start. Such names are
/// ".tmp-<process id>-<process start time>-<random>", and every Open removes
/// the ones of the folder whose writing process has ended (a process of the
/// same id but another start time counts as ended), never a live one's.
///
/// A target that is a symbolic link is written through: the link stays and
/// the file it leads to is replaced. A target that exists but is not a
/// regular file (a folder, a device, a pipe, a link to one) is refused, as is
/// a link that leads nowhere. A replaced file's permission bits (and, where
/// the process may set them, owner and group) pass to the new file; a new
/// file gets 0666 less the process's umask.
class ZEL_API AtomicFile {
public:
  AtomicFile() noexcept = default;
  /// Discards the file unless it was committed.
  ~AtomicFile();
  AtomicFile(const AtomicFile&) = delete;
  AtomicFile& operator=(const AtomicFile&) = delete;

  /// Starts the new file for `path`. False, with `error` set to the reason
  /// (strerror-style text), when the target is refused or no file can be
  /// made in its folder; nothing is changed then. Discards a file already
  /// started by this object first.
  bool Open(const std::string& path, std::string* error = nullptr);
  /// Appends `bytes`; false (with the reason) when not open or the write fails.
  bool Write(std::string_view bytes, std::string* error = nullptr);
  /// Puts the written bytes on the storage device and the file in place of
  /// the target, then flushes the folder. False (with the reason, target
  /// untouched) when not open or any step fails. The object is closed after.
  bool Commit(std::string* error = nullptr);
  /// Drops the file started by Open, leaving the target as it was.
  void Discard() noexcept;
  /// Whether a file is started and not yet committed or discarded.
  bool IsOpen() const noexcept { return m_descriptor >= 0; }

private:
  int m_descriptor = -1;
  std::string m_target;    // the file to replace, links resolved
  std::string m_temporary; // the named file, when the system has no unnamed ones
  bool m_unnamed = false;
};

/// Replaces the file `path` with `bytes` through an AtomicFile (see there for
/// links, special files, permission bits and leftovers). True on success;
/// false, with the reason in `error` when given, and the file untouched,
/// otherwise.
ZEL_API bool WriteFileAtomically(const std::string& path, std::string_view bytes,
                                 std::string* error = nullptr);

/// Removes from `folder` the temporary files that AtomicFile named and whose
/// writing process has ended; returns how many were removed. Files of live
/// processes and all other files are kept. AtomicFile::Open calls this.
ZEL_API int RemoveStaleTemporaryFiles(const std::string& folder);

} // namespace SystemIO
