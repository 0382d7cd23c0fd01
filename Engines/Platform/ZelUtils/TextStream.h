/// @file
/// Text over byte streams: TextStreamWriter encodes UTF-16 text into a Stream,
/// TextStreamReader decodes a whole Stream into UTF-16 text. Malformed input
/// never fails a read: every broken sequence becomes U+FFFD.
#pragma once

#include <ZelPlatform/Export.h>
#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Stream.h>

namespace ZelUtils {

namespace TextStream {
/// The byte encoding of a text stream. The system default is UTF-8.
enum Encoding : int { SystemDefault = 0, UTF16LE = 1, UTF16BE = 2, UTF8 = 3 };
} // namespace TextStream

/// Encodes UTF-16 text into a byte stream.
class ZEL_API TextStreamWriter {
public:
  /// Writes to `stream` (shared with the caller) in `encoding`; with
  /// `writeByteOrderMark` the first Write starts with the encoding's mark.
  TextStreamWriter(Stream stream, TextStream::Encoding encoding, bool writeByteOrderMark);

  /// Encodes and writes `text`, replacing unpaired surrogates by U+FFFD, then
  /// flushes. False when the stream is not writable, the encoding is unknown
  /// or a write fails.
  bool Write(const ZelStringT<char16_t>& text);

private:
  Stream m_stream;
  TextStream::Encoding m_encoding;
  bool m_byteOrderMarkPending;
};

/// Decodes a byte stream into UTF-16 text.
class ZEL_API TextStreamReader {
public:
  /// Reads from `stream` (shared with the caller), expecting `encoding`. A byte
  /// order mark at the start (UTF-8, UTF-16LE or UTF-16BE) wins over `encoding`
  /// and is not part of the text.
  TextStreamReader(Stream stream, TextStream::Encoding encoding);

  /// Everything from the stream's position to its end, decoded; malformed
  /// sequences become U+FFFD. Empty when the stream is not readable or the
  /// encoding is unknown.
  ZelStringT<char16_t> ReadToEnd();

private:
  Stream m_stream;
  TextStream::Encoding m_encoding;
};

} // namespace ZelUtils
