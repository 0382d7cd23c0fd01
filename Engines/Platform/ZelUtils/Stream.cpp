#include <ZelUtils/Stream.h>

#include <Internal/NativePath.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <utility>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace ZelUtils {

Stream::Impl::~Impl() = default;

std::size_t Stream::Read(void* buffer, std::size_t size) {
  if (!IsReadable() || size == 0 || buffer == nullptr)
    return 0;
  return m_impl->Read(buffer, size);
}

bool Stream::Write(const void* data, std::size_t size) {
  if (!IsWritable())
    return false;
  if (size == 0)
    return true;
  return data != nullptr && m_impl->Write(data, size);
}

bool Stream::Flush() { return m_impl && m_impl->Flush(); }

namespace {

class FileImpl final : public Stream::Impl {
public:
  FileImpl(int descriptor, bool writable) noexcept
      : m_descriptor(descriptor), m_writable(writable) {}
  ~FileImpl() override { ::close(m_descriptor); }
  FileImpl(const FileImpl&) = delete;
  FileImpl& operator=(const FileImpl&) = delete;

  std::size_t Read(void* buffer, std::size_t size) override {
    auto* bytes = static_cast<char*>(buffer);
    std::size_t done = 0;
    while (done < size) {
      const ssize_t count = ::read(m_descriptor, bytes + done, size - done);
      if (count < 0 && errno == EINTR)
        continue;
      if (count <= 0)
        break;
      done += static_cast<std::size_t>(count);
    }
    return done;
  }

  bool Write(const void* data, std::size_t size) override {
    const auto* bytes = static_cast<const char*>(data);
    while (size > 0) {
      const ssize_t count = ::write(m_descriptor, bytes, size);
      if (count < 0 && errno == EINTR)
        continue;
      if (count <= 0)
        return false;
      bytes += count;
      size -= static_cast<std::size_t>(count);
    }
    return true;
  }

  // Writes go straight to the file; nothing is buffered here.
  bool Flush() override { return true; }
  bool IsReadable() const noexcept override { return !m_writable; }
  bool IsWritable() const noexcept override { return m_writable; }

private:
  int m_descriptor;
  bool m_writable;
};

// A stream on the file that `open` gives for `nativePath` and `flags`; the
// unusable stream when it fails or the file is a folder.
Stream OpenNative(const std::string& nativePath, int flags) {
  int descriptor;
  do {
    descriptor = ::open(nativePath.c_str(), flags, 0666);
  } while (descriptor < 0 && errno == EINTR);
  if (descriptor < 0)
    return Stream();
  // A folder opens for reading on some systems but yields no bytes.
  struct stat status;
  if (::fstat(descriptor, &status) != 0 || S_ISDIR(status.st_mode)) {
    ::close(descriptor);
    return Stream();
  }
  try {
    return Stream(std::make_shared<FileImpl>(descriptor, (flags & O_ACCMODE) != O_RDONLY));
  } catch (...) {
    ::close(descriptor);
    throw;
  }
}

Stream OpenFile(const ZelStringT<char16_t>& path, bool forWriting) {
  std::string nativePath;
  if (!ZelPlatform::detail::ToNativePath(path, nativePath))
    return Stream();
  return OpenNative(nativePath,
                    forWriting ? O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC : O_RDONLY | O_CLOEXEC);
}

class MemoryImpl final : public Stream::Impl {
public:
  explicit MemoryImpl(std::string bytes) noexcept : m_bytes(std::move(bytes)) {}

  std::size_t Read(void* buffer, std::size_t size) override {
    const std::size_t count = std::min(size, m_bytes.size() - m_readPosition);
    std::memcpy(buffer, m_bytes.data() + m_readPosition, count);
    m_readPosition += count;
    return count;
  }
  bool Write(const void* data, std::size_t size) override {
    m_bytes.append(static_cast<const char*>(data), size);
    return true;
  }
  bool Flush() override { return true; }
  bool IsReadable() const noexcept override { return true; }
  bool IsWritable() const noexcept override { return true; }

  const std::string& GetBytes() const noexcept { return m_bytes; }

private:
  std::string m_bytes;
  std::size_t m_readPosition = 0;
};

} // namespace

Stream FileStream::Create(const ZelStringT<char16_t>& path) { return OpenFile(path, true); }

Stream FileStream::Open(const ZelStringT<char16_t>& path) { return OpenFile(path, false); }

Stream MemoryStream::Create() { return Stream(std::make_shared<MemoryImpl>(std::string())); }

Stream MemoryStream::FromBytes(std::string bytes) {
  return Stream(std::make_shared<MemoryImpl>(std::move(bytes)));
}

std::string MemoryStream::GetBytes(const Stream& stream) {
  const auto* memory = dynamic_cast<const MemoryImpl*>(stream.GetImpl());
  return memory ? memory->GetBytes() : std::string();
}

} // namespace ZelUtils
