#include <SystemIO/FileSystem.h>

#include <Internal/NativePath.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <system_error>

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace SystemIO {

bool File::MoveAside(const ZelStringT<char16_t>& source, const ZelStringT<char16_t>& target) {
  std::string nativeSource, nativeTarget;
  if (!ZelPlatform::detail::ToNativePath(source, nativeSource) ||
      !ZelPlatform::detail::ToNativePath(target, nativeTarget))
    return false;
  if (::renameat2(AT_FDCWD, nativeSource.c_str(), AT_FDCWD, nativeTarget.c_str(),
                  RENAME_NOREPLACE) == 0)
    return true;
  if (errno != EINVAL && errno != ENOSYS)
    return false;
  // File systems without the flag: a second name first, which cannot replace.
  return ::link(nativeSource.c_str(), nativeTarget.c_str()) == 0 &&
         (::unlink(nativeSource.c_str()) == 0 || (::unlink(nativeTarget.c_str()), false));
}

bool File::Exists(const ZelStringT<char16_t>& path) {
  std::string nativePath;
  struct stat status;
  return ZelPlatform::detail::ToNativePath(path, nativePath) &&
         ::lstat(nativePath.c_str(), &status) == 0;
}

bool File::ReadRegular(const ZelStringT<char16_t>& path, std::size_t maxBytes, std::string& bytes,
                       std::string* error) {
  bytes.clear();
  const auto fail = [error](const std::string& reason) {
    if (error)
      *error = reason;
    return false;
  };
  std::string nativePath;
  if (!ZelPlatform::detail::ToNativePath(path, nativePath))
    return fail("the path cannot name a file");
  // Non-blocking, so that opening a pipe does not wait for a writer.
  int descriptor;
  do {
    descriptor = ::open(nativePath.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
  } while (descriptor < 0 && errno == EINTR);
  if (descriptor < 0)
    return fail(std::generic_category().message(errno));
  const std::unique_ptr<int, void (*)(int*)> closer(&descriptor, [](int* d) { ::close(*d); });
  struct stat status;
  if (::fstat(descriptor, &status) != 0)
    return fail(std::generic_category().message(errno));
  if (!S_ISREG(status.st_mode))
    return fail("not a regular file");
  const std::string tooLarge = "larger than " + std::to_string(maxBytes) + " bytes";
  if (static_cast<std::uintmax_t>(status.st_size) > maxBytes)
    return fail(tooLarge);
  bytes.resize(static_cast<std::size_t>(status.st_size));
  std::size_t done = 0;
  // One byte beyond the size, to notice a file that grew meanwhile.
  for (;;) {
    if (done == bytes.size()) {
      if (done > maxBytes) {
        bytes.clear();
        return fail(tooLarge);
      }
      bytes.resize(done + 1 + std::min<std::size_t>(done, maxBytes - done));
    }
    const ssize_t count = ::read(descriptor, &bytes[done], bytes.size() - done);
    if (count < 0 && errno == EINTR)
      continue;
    if (count < 0) {
      bytes.clear();
      return fail(std::generic_category().message(errno));
    }
    if (count == 0)
      break;
    done += static_cast<std::size_t>(count);
  }
  bytes.resize(done);
  return true;
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
