/// @file
/// FolderPresetManager: a preset manager that a host can use as it is. Every
/// set lives in "<folder>/<set>.qsty"; a set's sheet is read from its file on
/// first request and kept until the manager goes or the sets are reloaded.
#pragma once

#include <Styles/Export.h>
#include <Styles/StylePresetManager.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <string>
#include <vector>

namespace Styles {

/// A preset manager whose sets are the preset files of one folder.
class STYLES_API FolderPresetManager : public StylePresetManager {
public:
  /// The largest set file that is read, in bytes (32 MiB); a larger one does
  /// not load, as a damaged one.
  static constexpr std::size_t kMaxSetFileBytes = std::size_t{32} << 20;

  /// Keeps the sets in `folder`, which must exist; no set is read yet. Removes
  /// the temporary files that saves killed before finishing left there.
  explicit FolderPresetManager(ZelStringT<char16_t> folder);
  ~FolderPresetManager() override;

  /// The sets loaded or with a file in the folder, sorted; a listed file may
  /// still fail to load.
  std::vector<SetName> GetPresetSetNames() const override;
  /// The way to start a set, since a set without a file has no sheet: keeps an
  /// empty sheet for it and writes its file. Null, with nothing written, when
  /// the name is not valid, the set is loaded, a non-empty file of that name
  /// exists (readable or not, it is never overwritten here) or the file
  /// cannot be written. The sheet is owned by the manager.
  StyleSheet* CreatePresetSet(const SetName& setName) override;
  /// The set's sheet, read from its file on first request and then kept; the
  /// manager owns it. Null for an invalid name, or a file that is missing, not
  /// a regular file (pipes and devices are never read, links to them neither),
  /// larger than kMaxSetFileBytes or not a readable document; nothing is kept
  /// then, and the file is left untouched.
  StyleSheet* GetPresetStyleSheet(const SetName& setName) const override;
  /// Destroys every loaded sheet, with the presets handed out from it.
  void ReloadPresetSets() override;
  ZelStringT<char16_t> GetPresetFolder() const override;

  /// Moves the file of a set that does not load (damaged, refused or
  /// unreadable) aside to "<set>.qsty.damaged-<UTC time>" (with "-2", "-3"...
  /// when taken), so that CreatePresetSet can start the set afresh; the moved
  /// file is never listed as a set. True when it was moved, with its new path
  /// in `movedTo` when given; false for an invalid name, a set that loads, no
  /// file, or a move that fails.
  bool SetAsideDamagedSet(const SetName& setName, ZelStringT<char16_t>* movedTo = nullptr);

  /// Whether the last Save (also the one inside AddPreset, DeletePreset or
  /// CreatePresetSet) left the set's file unwritten, even when it reported
  /// success (Save counts a file that cannot be made as success).
  bool LastSaveFailed() const noexcept;
  /// Why the last Save failed, strerror-style ("Permission denied", "No space
  /// left on device"); empty after a save that wrote the file.
  const std::string& GetLastSaveError() const noexcept;

private:
  ZelStringT<char16_t> m_folder;
};

} // namespace Styles
