/// @file
/// FolderPresetManager: a preset manager that a host can use as it is. Every
/// set lives in "<folder>/<set>.qsty"; a set's sheet is read from its file on
/// first request and kept until the manager goes or the sets are reloaded.
#pragma once

#include <Styles/Export.h>
#include <Styles/StylePresetManager.h>

#include <ZelPlatform/ZelString.h>

#include <vector>

namespace Styles {

/// A preset manager whose sets are the preset files of one folder.
class STYLES_API FolderPresetManager : public StylePresetManager {
public:
  /// Keeps the sets in `folder`, which must exist; nothing is read yet.
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
  /// manager owns it. Null for an invalid name, or a file that is missing or
  /// does not hold a readable document; nothing is kept then, and the file
  /// is left untouched.
  StyleSheet* GetPresetStyleSheet(const SetName& setName) const override;
  /// Destroys every loaded sheet, with the presets handed out from it.
  void ReloadPresetSets() override;
  ZelStringT<char16_t> GetPresetFolder() const override;

private:
  ZelStringT<char16_t> m_folder;
};

} // namespace Styles
