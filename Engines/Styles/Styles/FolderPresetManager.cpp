#include <Styles/FolderPresetManager.h>

#include <Styles/StyleSheet.h>

#include <SystemIO/FileSystem.h>
#include <SystemIO/Path.h>
#include <ZelUtils/Stream.h>

#include <algorithm>
#include <memory>
#include <new>
#include <utility>

namespace Styles {

namespace {

// Whether `path` is a file holding at least one byte.
bool HasContent(const ZelStringT<char16_t>& path) {
  ZelUtils::Stream stream = ZelUtils::FileStream::Open(path);
  char byte;
  return stream.Read(&byte, 1) == 1;
}

} // namespace

FolderPresetManager::FolderPresetManager(ZelStringT<char16_t> folder)
    : m_folder(std::move(folder)) {}

FolderPresetManager::~FolderPresetManager() = default;

std::vector<StylePresetManager::SetName> FolderPresetManager::GetPresetSetNames() const {
  std::vector<SetName> names;
  for (const auto& [name, sheet] : m_sheets)
    if (sheet)
      names.push_back(name);
  const std::size_t extensionLength = GetFileName(SetName()).GetLength();
  for (const ZelStringT<char16_t>& file : SystemIO::Directory::GetFileNames(m_folder)) {
    if (file.GetLength() <= extensionLength)
      continue;
    SetName name(file.GetView().substr(0, file.GetLength() - extensionLength));
    if (GetFileName(name) == file && IsValidSetName(name))
      names.push_back(std::move(name));
  }
  std::sort(names.begin(), names.end());
  names.erase(std::unique(names.begin(), names.end()), names.end());
  return names;
}

StyleSheet* FolderPresetManager::CreatePresetSet(const SetName& setName) {
  if (!IsValidSetName(setName))
    return nullptr;
  const auto loaded = m_sheets.find(setName);
  const ZelStringT<char16_t> path = SystemIO::Path::Combine(m_folder, GetFileName(setName));
  if ((loaded != m_sheets.end() && loaded->second) || HasContent(path))
    return nullptr;
  std::unique_ptr<StyleSheet> sheet(new StyleSheet);
  StyleSheet*& entry = m_sheets[setName];
  entry = sheet.release();
  // Save reports success also when no file could be made; the file must
  // hold the new document for the set to exist.
  if (Save(setName) && HasContent(path))
    return entry;
  delete entry;
  m_sheets.erase(setName);
  return nullptr;
}

StyleSheet* FolderPresetManager::GetPresetStyleSheet(const SetName& setName) const {
  if (!IsValidSetName(setName))
    return nullptr;
  const auto loaded = m_sheets.find(setName);
  if (loaded != m_sheets.end() && loaded->second)
    return loaded->second;
  ZelUtils::Stream stream =
      ZelUtils::FileStream::Open(SystemIO::Path::Combine(m_folder, GetFileName(setName)));
  if (!stream)
    return nullptr;
  std::unique_ptr<StyleSheet> sheet(new StyleSheet);
  try {
    if (!sheet->Import(stream, true))
      return nullptr;
  } catch (const std::bad_alloc&) {
    throw;
  } catch (...) {
    // A document that the behaviours reject is as unreadable as broken text.
    return nullptr;
  }
  StyleSheet*& entry = m_sheets[setName];
  delete entry; // a null entry left by a derived class
  entry = sheet.release();
  return entry;
}

void FolderPresetManager::ReloadPresetSets() {
  std::map<SetName, StyleSheet*> sheets;
  sheets.swap(m_sheets);
  for (auto& entry : sheets)
    delete entry.second;
}

ZelStringT<char16_t> FolderPresetManager::GetPresetFolder() const { return m_folder; }

} // namespace Styles
