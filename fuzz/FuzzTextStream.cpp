// TextStreamReader over the raw bytes in every encoding (byte order marks
// and malformed sequences included): the text read is well-formed UTF-16,
// and writing it with a byte order mark and reading it back gives the same
// text (without a mark, text that starts like one cannot round-trip).
#include "FuzzCheck.h"

#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <cstddef>
#include <cstdint>
#include <string>

using namespace ZelUtils;

namespace {

bool IsWellFormed(std::u16string_view text) {
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char16_t unit = text[i];
    if (unit >= 0xD800 && unit <= 0xDBFF && i + 1 < text.size() && text[i + 1] >= 0xDC00 &&
        text[i + 1] <= 0xDFFF)
      ++i;
    else if (unit >= 0xD800 && unit <= 0xDFFF)
      return false;
  }
  return true;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string bytes(reinterpret_cast<const char*>(data), size);
  for (const auto encoding : {TextStream::SystemDefault, TextStream::UTF16LE, TextStream::UTF16BE,
                              TextStream::UTF8, static_cast<TextStream::Encoding>(9)}) {
    const ZelStringT<char16_t> text =
        TextStreamReader(MemoryStream::FromBytes(bytes), encoding).ReadToEnd();
    FUZZ_CHECK(IsWellFormed(text.GetView()));
    Stream written = MemoryStream::Create();
    if (!TextStreamWriter(written, encoding, true).Write(text))
      continue;
    Stream reader = MemoryStream::FromBytes(MemoryStream::GetBytes(written));
    FUZZ_CHECK(TextStreamReader(reader, encoding).ReadToEnd() == text);
  }
  return 0;
}
