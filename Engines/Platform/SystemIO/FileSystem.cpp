#include <SystemIO/FileSystem.h>

#include <Internal/NativePath.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <memory>
#include <string>

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace SystemIO {

namespace {

// Flushes the entries of the folder that holds `nativePath`, so that a
// rename inside it is on the storage device.
void SyncParentFolder(const std::string& nativePath) {
  const std::size_t slash = nativePath.rfind('/');
  const std::string folder = slash == std::string::npos ? std::string(".")
                             : slash == 0               ? std::string("/")
                                                        : nativePath.substr(0, slash);
  int descriptor;
  do {
    descriptor = ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  } while (descriptor < 0 && errno == EINTR);
  if (descriptor < 0)
    return;
  ::fsync(descriptor);
  ::close(descriptor);
}

} // namespace

bool File::Replace(const ZelStringT<char16_t>& source, const ZelStringT<char16_t>& target) {
  std::string nativeSource, nativeTarget;
  if (!ZelPlatform::detail::ToNativePath(source, nativeSource) ||
      !ZelPlatform::detail::ToNativePath(target, nativeTarget))
    return false;
  if (::rename(nativeSource.c_str(), nativeTarget.c_str()) != 0)
    return false;
  SyncParentFolder(nativeTarget);
  return true;
}

bool File::Remove(const ZelStringT<char16_t>& path) {
  std::string nativePath;
  return ZelPlatform::detail::ToNativePath(path, nativePath) && ::unlink(nativePath.c_str()) == 0;
}

std::vector<ZelStringT<char16_t>> Directory::GetFileNames(const ZelStringT<char16_t>& folder) {
  std::vector<ZelStringT<char16_t>> names;
  std::string nativeFolder;
  if (!ZelPlatform::detail::ToNativePath(folder, nativeFolder))
    return names;
  const std::unique_ptr<DIR, int (*)(DIR*)> listing(::opendir(nativeFolder.c_str()), &::closedir);
  if (!listing)
    return names;
  const int folderDescriptor = ::dirfd(listing.get());
  while (const dirent* entry = ::readdir(listing.get())) {
    struct stat status;
    if (::fstatat(folderDescriptor, entry->d_name, &status, 0) != 0 || !S_ISREG(status.st_mode))
      continue;
    const std::string nativeName(entry->d_name);
    ZelStringT<char16_t> name(ZelPlatform::Utf8ToUtf16(nativeName));
    std::string check;
    if (!ZelPlatform::detail::ToNativePath(name, check) || check != nativeName)
      continue; // not valid UTF-8
    names.push_back(std::move(name));
  }
  std::sort(names.begin(), names.end());
  return names;
}

} // namespace SystemIO
