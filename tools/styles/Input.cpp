#include "Input.h"

#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

namespace StylesCommand {

namespace {

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
  const std::size_t bad = ZelPlatform::FindInvalidUtf8(bytes);
  if (bad == std::string_view::npos)
    return std::nullopt;
  // Lines and columns count characters: every byte that does not continue one.
  int line = 1, column = 1;
  for (std::size_t i = 0; i < bad; ++i) {
    if (bytes[i] == '\n') {
      ++line;
      column = 1;
    } else if ((static_cast<unsigned char>(bytes[i]) & 0xC0) != 0x80) {
      ++column;
    }
  }
  char hex[8];
  std::snprintf(hex, sizeof hex, "0x%02X", static_cast<unsigned char>(bytes[bad]));
  return Styles::Tools::Diagnostic{
      Styles::Tools::Severity::Error, "invalid-utf8", Text(),
      Text(ZelPlatform::Utf8ToUtf16(std::string("byte ") + hex +
                                    " is not part of a UTF-8 character")),
      line, column};
}

Text DecodeUtf8(std::string bytes) {
  return ZelUtils::TextStreamReader(ZelUtils::MemoryStream::FromBytes(std::move(bytes)),
                                    ZelUtils::TextStream::UTF8)
      .ReadToEnd();
}

} // namespace StylesCommand
