/// @file
/// ZelUtils::Stream: a byte stream handle. Copies of a handle share one open
/// stream (and its position); the stream closes when the last handle goes.
/// FileStream opens files by UTF-16 path; MemoryStream keeps the bytes in memory.
/// A handle that could not be opened tests false and refuses every operation.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <memory>
#include <string>

namespace ZelUtils {

/// A shared handle to an open byte stream; see the file overview.
class ZEL_API Stream {
public:
  /// What a concrete stream implements; Stream forwards to it.
  class ZEL_API Impl {
  public:
    virtual ~Impl();
    /// Reads up to `size` bytes; returns how many were read, 0 at the end.
    virtual std::size_t Read(void* buffer, std::size_t size) = 0;
    /// Writes all `size` bytes; false when any of them could not be written.
    virtual bool Write(const void* data, std::size_t size) = 0;
    /// Pushes buffered bytes to their destination; false when that fails.
    virtual bool Flush() = 0;
    ///@{

    /// Whether the stream was opened for reading, or for writing.
    virtual bool IsReadable() const noexcept = 0;
    virtual bool IsWritable() const noexcept = 0;
    ///@}
  };

  /// The unusable stream.
  Stream() noexcept = default;
  /// A handle sharing ownership of `impl`; a null `impl` gives the unusable stream.
  explicit Stream(std::shared_ptr<Impl> impl) noexcept : m_impl(std::move(impl)) {}

  /// False for the unusable stream.
  explicit operator bool() const noexcept { return m_impl != nullptr; }
  ///@{

  /// Whether the stream can be read, or written; false for the unusable stream.
  bool IsReadable() const noexcept { return m_impl && m_impl->IsReadable(); }
  bool IsWritable() const noexcept { return m_impl && m_impl->IsWritable(); }
  ///@}

  /// Up to `size` bytes into `buffer`; the count read, 0 at the end, on error
  /// or when the stream is not readable.
  std::size_t Read(void* buffer, std::size_t size);
  /// Writes all `size` bytes; false when the stream is not writable or fails.
  bool Write(const void* data, std::size_t size);
  /// Pushes buffered bytes to their destination; false when that fails.
  bool Flush();

  /// The implementation, not owned by the caller; null for the unusable stream.
  Impl* GetImpl() const noexcept { return m_impl.get(); }

private:
  std::shared_ptr<Impl> m_impl;
};

/// Streams over files, named by UTF-16 paths.
struct ZEL_API FileStream {
  /// Opens `path` for writing, creating the file or truncating it. The stream
  /// tests false when the file cannot be created (missing folder, a folder,
  /// no permission, a path that is not valid UTF-16).
  static Stream Create(const ZelStringT<char16_t>& path);
  /// Opens an existing file for reading; the stream tests false when the file
  /// is missing, is a folder or cannot be read.
  static Stream Open(const ZelStringT<char16_t>& path);
};

/// Streams that keep their bytes in memory.
struct ZEL_API MemoryStream {
  /// An empty stream that can be written and then read back.
  static Stream Create();
  /// A stream that reads `bytes` from the start; writes append to them.
  static Stream FromBytes(std::string bytes);
  /// Every byte the memory stream holds, whatever has been read; empty for a
  /// stream that is not a memory stream.
  static std::string GetBytes(const Stream& stream);
};

} // namespace ZelUtils
