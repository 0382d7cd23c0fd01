#include <SystemIO/AtomicFile.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <memory>
#include <random>
#include <sstream>
#include <system_error>

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

namespace SystemIO {

namespace {

constexpr char k_strTemporaryPrefix[] = ".tmp-";

bool Fail(std::string* error, const std::string& reason) {
  if (error)
    *error = reason;
  return false;
}

// Fails with the text of the current errno.
bool FailWithErrno(std::string* error) {
  return Fail(error, std::generic_category().message(errno));
}

std::string FolderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? std::string(".")
         : slash == 0               ? std::string("/")
                                    : path.substr(0, slash);
}

// The start time of process `pid` in clock ticks after boot, from /proc; false
// when the process does not exist or /proc cannot tell.
bool GetStartTime(const std::string& pid, unsigned long long& startTime) {
  std::ifstream in("/proc/" + pid + "/stat");
  const std::string stat{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
  // The command name in parentheses may hold spaces; fields count from after it.
  const std::size_t nameEnd = stat.rfind(')');
  if (nameEnd == std::string::npos)
    return false;
  std::istringstream fields(stat.substr(nameEnd + 1));
  std::string field;
  for (int index = 3; index <= 22 && fields >> field; ++index)
    if (index == 22)
      return std::sscanf(field.c_str(), "%llu", &startTime) == 1;
  return false;
}

// The part of a temporary name that tells its writer: "<pid>-<start time>".
std::string WriterTag() {
  unsigned long long startTime = 0;
  GetStartTime("self", startTime); // 0 where /proc is missing
  return std::to_string(::getpid()) + "-" + std::to_string(startTime);
}

std::string TemporaryPath(const std::string& folder, const std::string& writer) {
  static thread_local std::mt19937_64 random{std::random_device{}()};
  char suffix[17];
  std::snprintf(suffix, sizeof suffix, "%016llx", static_cast<unsigned long long>(random()));
  return folder + "/" + k_strTemporaryPrefix + writer + "-" + suffix;
}

// Whether the writer named in a temporary file's `name` has ended; false for
// names that AtomicFile does not make.
bool IsStaleTemporaryName(const std::string& name) {
  unsigned long long pid = 0, startTime = 0;
  int length = 0;
  if (name.compare(0, sizeof k_strTemporaryPrefix - 1, k_strTemporaryPrefix) != 0 ||
      std::sscanf(name.c_str() + sizeof k_strTemporaryPrefix - 1, "%llu-%llu-%*16[0-9a-f]%n", &pid,
                  &startTime, &length) != 2 ||
      name.size() != sizeof k_strTemporaryPrefix - 1 + static_cast<std::size_t>(length) ||
      pid == 0 || pid > 0x7fffffffULL)
    return false;
  unsigned long long ownStart = 0;
  if (GetStartTime("self", ownStart)) {
    unsigned long long writerStart = 0;
    return !GetStartTime(std::to_string(pid), writerStart) || writerStart != startTime;
  }
  // Without /proc only a missing process counts as ended.
  return ::kill(static_cast<pid_t>(pid), 0) != 0 && errno == ESRCH;
}

// Checks `path` and says what to replace: the file itself, or the file a
// link leads to. `existing` receives the replaced file's status when there
// is one.
bool ResolveTarget(const std::string& path, std::string& target, struct stat& existing,
                   bool& exists, std::string* error) {
  exists = false;
  target = path;
  if (path.empty())
    return Fail(error, "empty path");
  // A name too long for the folder is reported when the file is put in place.
  if (::lstat(path.c_str(), &existing) != 0)
    return errno == ENOENT || errno == ENAMETOOLONG ? true : FailWithErrno(error);
  if (S_ISLNK(existing.st_mode)) {
    const std::unique_ptr<char, void (*)(void*)> resolved(::realpath(path.c_str(), nullptr),
                                                          &std::free);
    if (!resolved)
      return errno == ENOENT ? Fail(error, "symbolic link to a missing file")
                             : FailWithErrno(error);
    target = resolved.get();
    if (::stat(target.c_str(), &existing) != 0)
      return FailWithErrno(error);
  }
  if (!S_ISREG(existing.st_mode))
    return Fail(error, "not a regular file");
  exists = true;
  return true;
}

int OpenNamed(const std::string& path) {
  int descriptor;
  do {
    descriptor = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
  } while (descriptor < 0 && errno == EINTR);
  return descriptor;
}

} // namespace

int RemoveStaleTemporaryFiles(const std::string& folder) {
  const std::unique_ptr<DIR, int (*)(DIR*)> listing(::opendir(folder.c_str()), &::closedir);
  if (!listing)
    return 0;
  int removed = 0;
  while (const dirent* entry = ::readdir(listing.get())) {
    struct stat status;
    if (IsStaleTemporaryName(entry->d_name) &&
        ::fstatat(::dirfd(listing.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
        S_ISREG(status.st_mode) && ::unlinkat(::dirfd(listing.get()), entry->d_name, 0) == 0)
      ++removed;
  }
  return removed;
}

AtomicFile::~AtomicFile() { Discard(); }

void AtomicFile::Discard() noexcept {
  if (m_descriptor >= 0)
    ::close(m_descriptor);
  if (!m_temporary.empty())
    ::unlink(m_temporary.c_str());
  m_descriptor = -1;
  m_temporary.clear();
  m_target.clear();
  m_unnamed = false;
}

bool AtomicFile::Open(const std::string& path, std::string* error) {
  Discard();
  struct stat existing;
  bool exists = false;
  std::string target;
  if (!ResolveTarget(path, target, existing, exists, error))
    return false;
  const std::string folder = FolderOf(target);
  RemoveStaleTemporaryFiles(folder);

  int descriptor = -1;
#ifdef O_TMPFILE
  do {
    descriptor = ::open(folder.c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, 0666);
  } while (descriptor < 0 && errno == EINTR);
  // Kernels or file systems without unnamed files answer one of these.
  if (descriptor < 0 && errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL)
    return FailWithErrno(error);
  m_unnamed = descriptor >= 0;
#endif
  std::string temporary;
  if (descriptor < 0) {
    const std::string writer = WriterTag();
    do {
      temporary = TemporaryPath(folder, writer);
      descriptor = OpenNamed(temporary);
    } while (descriptor < 0 && errno == EEXIST);
    if (descriptor < 0)
      return FailWithErrno(error);
  }
  m_descriptor = descriptor;
  m_temporary = std::move(temporary);
  m_target = std::move(target);
  if (exists) {
    // Owner first: changing it may clear the set-id bits that fchmod restores.
    if (existing.st_uid != ::geteuid() || existing.st_gid != ::getegid())
      (void)::fchown(m_descriptor, existing.st_uid, existing.st_gid); // allowed only to some
    if (::fchmod(m_descriptor, existing.st_mode & 07777) != 0) {
      const int saved = errno;
      Discard();
      errno = saved;
      return FailWithErrno(error);
    }
  }
  return true;
}

bool AtomicFile::Write(std::string_view bytes, std::string* error) {
  if (m_descriptor < 0)
    return Fail(error, "no file is open");
  while (!bytes.empty()) {
    const ssize_t count = ::write(m_descriptor, bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR)
      continue;
    if (count <= 0)
      return count < 0 ? FailWithErrno(error) : Fail(error, "nothing written");
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
  return true;
}

bool AtomicFile::Commit(std::string* error) {
  if (m_descriptor < 0)
    return Fail(error, "no file is open");
  // Fails with the current errno's text, leaving the target untouched.
  const auto failed = [this, error] {
    const int saved = errno;
    Discard();
    errno = saved;
    return FailWithErrno(error);
  };
  int result;
  do {
    result = ::fsync(m_descriptor);
  } while (result != 0 && errno == EINTR);
  if (result != 0)
    return failed();
  const std::string folder = FolderOf(m_target);
  if (m_unnamed) {
    // An unnamed file can only be linked to a new name; the rename then
    // replaces the target in one step.
    const std::string self = "/proc/self/fd/" + std::to_string(m_descriptor);
    const std::string writer = WriterTag();
    do {
      m_temporary = TemporaryPath(folder, writer);
      result = ::linkat(AT_FDCWD, self.c_str(), AT_FDCWD, m_temporary.c_str(), AT_SYMLINK_FOLLOW);
    } while (result != 0 && errno == EEXIST);
    if (result != 0) {
      m_temporary.clear();
      return failed();
    }
  }
  if (::close(m_descriptor) != 0) {
    m_descriptor = -1;
    return failed();
  }
  m_descriptor = -1;
  if (::rename(m_temporary.c_str(), m_target.c_str()) != 0)
    return failed();
  m_temporary.clear();
  // Best effort: the rename survives a system crash once the folder is flushed.
  const int folderDescriptor = ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (folderDescriptor >= 0) {
    ::fsync(folderDescriptor);
    ::close(folderDescriptor);
  }
  Discard();
  return true;
}

bool WriteFileAtomically(const std::string& path, std::string_view bytes, std::string* error) {
  AtomicFile file;
  return file.Open(path, error) && file.Write(bytes, error) && file.Commit(error);
}

} // namespace SystemIO
