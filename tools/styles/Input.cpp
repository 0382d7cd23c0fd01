#include "Input.h"

#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

namespace StylesCommand {

namespace {

// The length of the UTF-8 sequence starting at `i`, or 0 when it is not one:
// overlong forms, surrogates and values above U+10FFFF are not UTF-8.
std::size_t SequenceLength(std::string_view bytes, std::size_t i) {
  const auto byte = [&](std::size_t k) { return static_cast<unsigned char>(bytes[k]); };
  const unsigned char lead = byte(i);
  if (lead < 0x80)
    return 1;
  std::size_t length = 0;
  unsigned char low = 0x80, high = 0xBF; // bounds of the second byte
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    low = lead == 0xE0 ? 0xA0 : 0x80;
    high = lead == 0xED ? 0x9F : 0xBF;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    low = lead == 0xF0 ? 0x90 : 0x80;
    high = lead == 0xF4 ? 0x8F : 0xBF;
  } else {
    return 0;
  }
  if (i + length > bytes.size() || byte(i + 1) < low || byte(i + 1) > high)
    return 0;
  for (std::size_t k = 2; k < length; ++k)
    if (byte(i + k) < 0x80 || byte(i + k) > 0xBF)
      return 0;
  return length;
}

struct FileCloser {
  void operator()(std::FILE* file) const { std::fclose(file); }
};

} // namespace

bool ReadBytes(const std::string& path, std::string& bytes, std::string& reason) {
  // Standard input is read once and kept: recognising a Word file reads it too.
  static std::optional<std::string> standardInput;
  if (path == "-" && standardInput) {
    bytes = *standardInput;
    return true;
  }
  std::unique_ptr<std::FILE, FileCloser> opened;
  std::FILE* file = stdin;
  if (path != "-") {
    opened.reset(std::fopen(path.c_str(), "rb"));
    if (!opened) {
      reason = std::strerror(errno);
      return false;
    }
    file = opened.get();
  }
  bytes.clear();
  char buffer[64 * 1024];
  while (const std::size_t count = std::fread(buffer, 1, sizeof buffer, file))
    bytes.append(buffer, count);
  if (std::ferror(file)) {
    reason = std::strerror(errno); // a folder gives "Is a directory"
    return false;
  }
  if (path == "-")
    standardInput = bytes;
  return true;
}

std::optional<Styles::Tools::Diagnostic> FindInvalidUtf8(std::string_view bytes) {
  // Text that starts with a UTF-16 byte-order mark is read as UTF-16.
  if (bytes.substr(0, 2) == "\xFF\xFE" || bytes.substr(0, 2) == "\xFE\xFF")
    return std::nullopt;
  int line = 1, column = 1;
  for (std::size_t i = 0; i < bytes.size();) {
    const std::size_t length = SequenceLength(bytes, i);
    if (length == 0) {
      char hex[8];
      std::snprintf(hex, sizeof hex, "0x%02X", static_cast<unsigned char>(bytes[i]));
      return Styles::Tools::Diagnostic{
          Styles::Tools::Severity::Error, "invalid-utf8", Text(),
          Text(ZelPlatform::Utf8ToUtf16(std::string("byte ") + hex +
                                        " is not part of a UTF-8 character")),
          line, column};
    }
    if (bytes[i] == '\n') {
      ++line;
      column = 1;
    } else {
      ++column;
    }
    i += length;
  }
  return std::nullopt;
}

Text DecodeUtf8(std::string bytes) {
  return ZelUtils::TextStreamReader(ZelUtils::MemoryStream::FromBytes(std::move(bytes)),
                                    ZelUtils::TextStream::UTF8)
      .ReadToEnd();
}

} // namespace StylesCommand
