// Json::Parse of the input read as UTF-16 units and, separately, as UTF-8
// converted to UTF-16. An accepted text reads back to the same value from
// either layout of ValueToString; the compact document and the writer agree
// with the value tree.
#include "FuzzCheck.h"

#include <Json/Json.h>
#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

namespace {

void CheckText(const ZelStringT<char16_t>& text) {
  Json::Value value;
  ZelStringT<char16_t> error;
  const bool accepted = Json::Parse(text, value, error);
  Json::Document document;
  ZelStringT<char16_t> documentError;
  FUZZ_CHECK(document.Parse(text, documentError) == accepted);
  FUZZ_CHECK(documentError == error);
  if (!accepted)
    return;
  FUZZ_CHECK(document.GetRoot().ToValue() == value);
  for (const bool format : {false, true}) {
    const ZelStringT<char16_t> written = Json::ValueToString(value, format);
    Json::Value again;
    FUZZ_CHECK(Json::Parse(written, again, error));
    FUZZ_CHECK(again == value);
  }
  Json::Writer writer(false);
  FUZZ_CHECK(writer.Write(value));
  FUZZ_CHECK(writer.TakeText() == Json::ValueToString(value, false));
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::u16string units(size / 2, u'\0');
  std::memcpy(units.data(), data, units.size() * 2);
  CheckText(ZelStringT<char16_t>(std::move(units)));
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  CheckText(ZelStringT<char16_t>(ZelPlatform::Utf8ToUtf16(bytes)));
  return 0;
}
