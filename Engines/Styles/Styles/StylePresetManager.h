/// @file
/// Style presets: ready-made styles that users save and reapply, grouped in
/// preset sets. Each set is one StyleSheet whose styles are the presets, kept
/// in the file "<set>.qsty" of a folder the host chooses. StylePresetManager
/// supplies the preset operations; a derived class says where the folder is
/// and how a set's sheet is found (FolderPresetManager is a ready one).
#pragma once

#include <Styles/Export.h>

#include <ZelPlatform/ZelString.h>

#include <map>
#include <string>
#include <vector>

namespace Styles {

class Style;
class StyleSheet;

/// The preset operations over sets that a derived class finds and keeps.
class STYLES_API StylePresetManager {
public:
  /// The name of a preset set, which names its file.
  using SetName = ZelStringT<char16_t>;

  StylePresetManager();
  StylePresetManager(const StylePresetManager&) = delete;
  StylePresetManager& operator=(const StylePresetManager&) = delete;

  /// Deletes every sheet kept in the map of loaded sets, with its presets.
  virtual ~StylePresetManager();

  /// @name What a derived class provides
  /// The virtual operations keep this order: it is part of the interface.
  /// The preset operations below call only GetPresetStyleSheet and
  /// GetPresetFolder; the other three are for the host's own use.
  ///@{

  /// The names of the sets that can be asked for, sorted.
  virtual std::vector<SetName> GetPresetSetNames() const = 0;
  /// Starts a new, empty set and returns its sheet (owned by the manager), or
  /// null when the name is not valid or the set cannot be made.
  virtual StyleSheet* CreatePresetSet(const SetName& setName) = 0;
  /// The sheet of the set, owned by the manager, or null when there is none.
  /// Loading it and keeping it in the map is the derived class's choice; a
  /// sheet returned stays valid until it is replaced or the manager goes.
  virtual StyleSheet* GetPresetStyleSheet(const SetName& setName) const = 0;
  /// Forgets the loaded sets so that the next request reads them anew; the
  /// sheets and presets handed out before are destroyed.
  virtual void ReloadPresetSets() = 0;
  /// The folder that holds the preset files.
  virtual ZelStringT<char16_t> GetPresetFolder() const = 0;
  ///@}

  /// Whether `setName` can name a set: not empty, not "." or "..", and without
  /// "/", "\" or NUL, so that its file lies directly inside the preset folder.
  /// Every operation below gives its false, null or empty result otherwise.
  static bool IsValidSetName(const SetName& setName);

  /// `setName` followed by ".qsty"; the name is not checked.
  ZelStringT<char16_t> GetFileName(const SetName& setName) const;
  /// Writes the set's sheet to its file: an empty file for a set without a
  /// sheet. The old file is replaced in one step, never left half written.
  /// True also when no file can be created in the folder (nothing is written
  /// then); false for an invalid set name, or when writing the new file fails
  /// (the old one stays). Exceptions from behaviours pass through, likewise.
  bool Save(const SetName& setName) const;

  /// The preset names of the set, in name order; empty without a sheet.
  std::vector<ZelStringT<char16_t>> GetPresetNames(const SetName& setName) const;
  /// Whether the set holds a preset called `name`, ignoring letter case.
  bool DoesPresetNameExist(const SetName& setName, ZelStringT<char16_t> name) const;
  /// Stores a copy of `style` (not owned) as the preset `name`, folded with its
  /// parents and free of every reference to other styles, then saves the set.
  /// With `replace` an existing preset of that name is deleted (presets that
  /// referred to it, only a set read from a file can hold such, refer to the
  /// new one); without, it is kept and the copy dropped. False without a sheet, a style or a name;
  /// otherwise true whatever the save gives, whose failure keeps the edit.
  bool AddPreset(const SetName& setName, ZelStringT<char16_t> name, const Style* style,
                 bool replace);
  /// Deletes the preset `name` and saves the set, even when there was no such
  /// preset. True when a preset was deleted. Presets that refer to it (only a
  /// set read from a file can hold such) take over its values first.
  bool DeletePreset(const SetName& setName, ZelStringT<char16_t> name);
  /// The preset `name` in any letter case, owned by the set's sheet, or null.
  Style* GetPreset(const SetName& setName, ZelStringT<char16_t> name);
  /// A preset name of the set that is not in use, starting from `baseName`;
  /// empty without a sheet or for an empty `baseName`.
  ZelStringT<char16_t> GetUnusedPresetName(const SetName& setName,
                                           const ZelStringT<char16_t>& baseName) const;

protected:
  /// The loaded sets, owned by the manager; only derived classes insert. A
  /// null entry is allowed. Mutable so that a const lookup can load a set.
  mutable std::map<SetName, StyleSheet*> m_sheets;
  /// Why the last Save left the set's file as it was (strerror-style text),
  /// also when Save reported success; empty after a save that wrote it.
  mutable std::string m_lastSaveError;
};

} // namespace Styles
