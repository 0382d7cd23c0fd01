#include <Styles/StylePresetManager.h>

#include <Styles/Style.h>
#include <Styles/StyleSheet.h>

#include <SystemIO/FileSystem.h>
#include <SystemIO/Path.h>
#include <ZelUtils/Stream.h>

#include <memory>
#include <utility>

namespace Styles {

namespace {

constexpr char16_t k_strPresetFileExtension[] = u".qsty";

// A file written beside its final place and moved over it only when
// complete; removed when it is never committed, exceptions included.
class TemporaryFile {
public:
  explicit TemporaryFile(const ZelStringT<char16_t>& folder)
      : m_stream(ZelUtils::FileStream::CreateTemporary(folder, m_path)) {}
  ~TemporaryFile() {
    m_stream = ZelUtils::Stream();
    if (m_path.IsEmpty())
      return;
    try {
      SystemIO::File::Remove(m_path);
    } catch (...) {
      // Out of memory for the path: a stray temporary file beats a crash.
    }
  }
  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;

  ZelUtils::Stream& GetStream() noexcept { return m_stream; }

  // Puts the written bytes on disk and the file in place of `target`.
  bool Commit(const ZelStringT<char16_t>& target) {
    if (!ZelUtils::FileStream::SyncToDisk(m_stream))
      return false;
    m_stream = ZelUtils::Stream();
    if (!SystemIO::File::Replace(m_path, target))
      return false;
    m_path = ZelStringT<char16_t>();
    return true;
  }

private:
  ZelStringT<char16_t> m_path;
  ZelUtils::Stream m_stream;
};

// Makes every other style of `sheet` drop its references to `style`, keeping
// their effective values, so that `style` can be destroyed. Presets made here
// refer to nothing, but a set read from a file may.
void CutReferencesTo(StyleSheet& sheet, Style* style) {
  Style* const doomed[] = {style};
  const StyleSpan span(doomed, doomed + 1, true);
  for (Style* other : sheet.GetStyles())
    if (other && other != style)
      other->RemoveDependency(span, true);
}

} // namespace

StylePresetManager::StylePresetManager() = default;

StylePresetManager::~StylePresetManager() {
  for (auto& entry : m_sheets)
    delete entry.second;
  m_sheets.clear();
}

bool StylePresetManager::IsValidSetName(const SetName& setName) {
  if (setName.IsEmpty() || setName == u"." || setName == u"..")
    return false;
  for (const char16_t c : setName)
    if (c == u'/' || c == u'\\' || c == u'\0')
      return false;
  return true;
}

ZelStringT<char16_t> StylePresetManager::GetFileName(const SetName& setName) const {
  return setName + k_strPresetFileExtension;
}

bool StylePresetManager::Save(const SetName& setName) const {
  if (!IsValidSetName(setName))
    return false;
  const ZelStringT<char16_t> folder = GetPresetFolder();
  TemporaryFile file(folder);
  // Deliberately, a file that cannot be created counts as success: only a
  // failed write reports false.
  if (!file.GetStream())
    return true;
  // Without a sheet the empty file still replaces the set's file.
  const StyleSheet* sheet = GetPresetStyleSheet(setName);
  if (sheet && !sheet->Export(file.GetStream()))
    return false;
  return file.Commit(SystemIO::Path::Combine(folder, GetFileName(setName)));
}

std::vector<ZelStringT<char16_t>> StylePresetManager::GetPresetNames(const SetName& setName) const {
  const StyleSheet* sheet = IsValidSetName(setName) ? GetPresetStyleSheet(setName) : nullptr;
  return sheet ? sheet->GetStyleNames() : std::vector<ZelStringT<char16_t>>();
}

bool StylePresetManager::DoesPresetNameExist(const SetName& setName,
                                             ZelStringT<char16_t> name) const {
  const StyleSheet* sheet = IsValidSetName(setName) ? GetPresetStyleSheet(setName) : nullptr;
  if (!sheet)
    return false;
  for (const ZelStringT<char16_t>& presetName : sheet->GetStyleNames())
    if (name.CompareNoCase(presetName) == 0)
      return true;
  return false;
}

bool StylePresetManager::AddPreset(const SetName& setName, ZelStringT<char16_t> name,
                                   const Style* style, bool replace) {
  StyleSheet* sheet = IsValidSetName(setName) ? GetPresetStyleSheet(setName) : nullptr;
  if (!sheet || !style || name.IsEmpty())
    return false;
  // The preset stands alone: its parents are folded in and every reference
  // to a style of the source's sheet is cut.
  std::unique_ptr<Style> copy(new Style(*style));
  copy->RemoveAllDependencies();
  // A replaced preset is deleted; the sheet has already pointed the presets
  // that referred to it at the new one.
  delete sheet->AddStyle(name, copy.release(), replace);
  Save(setName);
  return true;
}

bool StylePresetManager::DeletePreset(const SetName& setName, ZelStringT<char16_t> name) {
  StyleSheet* sheet = IsValidSetName(setName) ? GetPresetStyleSheet(setName) : nullptr;
  if (!sheet || name.IsEmpty())
    return false;
  std::unique_ptr<Style> removed(sheet->RemoveStyle(name));
  const bool found = removed != nullptr;
  if (removed) {
    CutReferencesTo(*sheet, removed.get());
    removed.reset();
  }
  // The file is written even when nothing was deleted.
  Save(setName);
  return found;
}

Style* StylePresetManager::GetPreset(const SetName& setName, ZelStringT<char16_t> name) {
  const StyleSheet* sheet = IsValidSetName(setName) ? GetPresetStyleSheet(setName) : nullptr;
  return sheet && !name.IsEmpty() ? sheet->GetStyle(name) : nullptr;
}

ZelStringT<char16_t>
StylePresetManager::GetUnusedPresetName(const SetName& setName,
                                        const ZelStringT<char16_t>& baseName) const {
  const StyleSheet* sheet = IsValidSetName(setName) ? GetPresetStyleSheet(setName) : nullptr;
  return sheet && !baseName.IsEmpty() ? sheet->GetUnusedStyleName(baseName)
                                      : ZelStringT<char16_t>();
}

} // namespace Styles
