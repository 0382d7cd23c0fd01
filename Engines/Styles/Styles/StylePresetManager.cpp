#include <Styles/StylePresetManager.h>

#include <Styles/Style.h>
#include <Styles/StyleSheet.h>

#include <SystemIO/AtomicFile.h>
#include <SystemIO/Path.h>
#include <ZelUtils/Stream.h>

#include <memory>
#include <string>
#include <utility>

namespace Styles {

namespace {

constexpr char16_t k_strPresetFileExtension[] = u".qsty";

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
  m_lastSaveError = "the set name cannot name a file";
  if (!IsValidSetName(setName))
    return false;
  const ZelStringT<char16_t> path =
      SystemIO::Path::Combine(GetPresetFolder(), GetFileName(setName));
  const std::string nativePath = ZelPlatform::Utf16ToUtf8(path.GetView());
  if (ZelPlatform::Utf8ToUtf16(nativePath) != path.GetView())
    return false; // unpaired surrogates
  SystemIO::AtomicFile file;
  // Deliberately, a file that cannot be created counts as success: only a
  // failed write reports false. The reason stays for those who ask.
  if (!file.Open(nativePath, &m_lastSaveError))
    return true;
  m_lastSaveError = "the save was interrupted";
  // Without a sheet the empty file still replaces the set's file.
  std::string bytes;
  if (const StyleSheet* sheet = GetPresetStyleSheet(setName)) {
    ZelUtils::Stream stream = ZelUtils::MemoryStream::Create();
    if (!sheet->Export(stream)) {
      m_lastSaveError = "the set cannot be written as a document";
      return false;
    }
    bytes = ZelUtils::MemoryStream::GetBytes(stream);
  }
  if (!file.Write(bytes, &m_lastSaveError) || !file.Commit(&m_lastSaveError))
    return false;
  m_lastSaveError.clear();
  return true;
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
