#include <Styles/FolderPresetManager.h>

#include <Styles/StyleSheet.h>

#include <SystemIO/AtomicFile.h>
#include <SystemIO/FileSystem.h>
#include <SystemIO/Path.h>
#include <ZelUtils/Stream.h>

#include <algorithm>
#include <ctime>
#include <memory>
#include <new>
#include <string>
#include <utility>

namespace Styles {

namespace {

// Whether `path` names anything but a missing or empty regular file: what a
// new set must never replace.
bool HasContent(const ZelStringT<char16_t>& path) {
  std::string bytes;
  return SystemIO::File::Exists(path) && !SystemIO::File::ReadRegular(path, 0, bytes);
}

// "YYYYMMDDTHHMMSSZ" for the present moment.
std::string UtcTimeStamp() {
  const std::time_t now = std::time(nullptr);
  std::tm parts{};
  char text[32] = "unknown-time";
  if (::gmtime_r(&now, &parts))
    std::strftime(text, sizeof text, "%Y%m%dT%H%M%SZ", &parts);
  return text;
}

} // namespace

FolderPresetManager::FolderPresetManager(ZelStringT<char16_t> folder)
    : m_folder(std::move(folder)) {
  // What saves killed before finishing left behind goes at once.
  if (!m_folder.IsEmpty())
    SystemIO::RemoveStaleTemporaryFiles(ZelPlatform::Utf16ToUtf8(m_folder.GetView()));
}

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
  std::string bytes;
  if (!SystemIO::File::ReadRegular(SystemIO::Path::Combine(m_folder, GetFileName(setName)),
                                   kMaxSetFileBytes, bytes))
    return nullptr;
  ZelUtils::Stream stream = ZelUtils::MemoryStream::FromBytes(std::move(bytes));
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

bool FolderPresetManager::SetAsideDamagedSet(const SetName& setName,
                                             ZelStringT<char16_t>* movedTo) {
  if (!IsValidSetName(setName) || GetPresetStyleSheet(setName))
    return false;
  const ZelStringT<char16_t> path = SystemIO::Path::Combine(m_folder, GetFileName(setName));
  if (!HasContent(path))
    return false;
  const ZelStringT<char16_t> aside =
      path + u".damaged-" + ZelStringT<char16_t>(ZelPlatform::Utf8ToUtf16(UtcTimeStamp()));
  for (int attempt = 1; attempt < 100; ++attempt) {
    const ZelStringT<char16_t> target =
        attempt == 1 ? aside
                     : aside + u"-" +
                           ZelStringT<char16_t>(ZelPlatform::Utf8ToUtf16(std::to_string(attempt)));
    if (SystemIO::File::MoveAside(path, target)) {
      if (movedTo)
        *movedTo = target;
      return true;
    }
    if (!SystemIO::File::Exists(target))
      return false;
  }
  return false;
}

bool FolderPresetManager::LastSaveFailed() const noexcept { return !m_lastSaveError.empty(); }

const std::string& FolderPresetManager::GetLastSaveError() const noexcept {
  return m_lastSaveError;
}

} // namespace Styles
