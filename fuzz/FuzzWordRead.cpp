// ReadWord of the input, taken as a package or as a bare styles part, under
// the Word schema. A read either fails with a message or gives a sheet whose
// written styles part reads back into a sheet that writes the same part, as
// canonical XML (raw and rebuilt elements may order their attributes apart).
#include "FuzzCheck.h"

#include <StylesWord/WordFile.h>
#include <StylesWord/WordSchema.h>

#include <Styles/StyleSheet.h>

#include <cstddef>
#include <cstdint>
#include <string_view>

using namespace Styles;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const bool registered = [] {
    Tools::SchemaRegistration registration;
    Tools::SchemaError error;
    return Tools::RegisterSchema(Word::WordSchema(), registration, error);
  }();
  FUZZ_CHECK(registered);
  // Small limits keep each run quick; the reader must hold to them.
  Word::Limits limits;
  limits.maxPartSize = 2 << 20;
  limits.maxEntries = 64;
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  StyleSheet sheet;
  Word::ReadReport report;
  if (!Word::ReadWord(bytes, sheet, report, limits)) {
    FUZZ_CHECK(!report.error.message.IsEmpty());
    FUZZ_CHECK(sheet.GetStyles().empty());
    return 0;
  }
  const std::string written = Word::WriteStylesPart(sheet);
  StyleSheet again;
  FUZZ_CHECK(Word::ReadWord(written, again, report, limits));
  FUZZ_CHECK(Word::SameXml(Word::WriteStylesPart(again), written));
  return 0;
}
