// The toolkit on the input (as UTF-8) with the built-in schema: validation
// never fails hard, and ImportChecked either fails leaving the target as it
// was, or succeeds with exactly what StyleSheet::ImportFromString gives.
#include "FuzzCheck.h"

#include <StylesTools/Diagnostics.h>
#include <StylesTools/Schema.h>

#include <Styles/StyleSheet.h>

#include <ZelPlatform/ZelString.h>

#include <cstddef>
#include <cstdint>
#include <exception>
#include <string_view>
#include <vector>

using namespace Styles;
using Text = ZelStringT<char16_t>;

namespace {

// Styles already in the target, so that imports replace and link to them.
constexpr char16_t kSeed[] = uR"({"version": 1,
  "paragraph": {"Normal": {"spaceAfter": "6"},
                "Heading": {"inherits": "Normal", "character": {"inherits": "Strong"}}},
  "character": {"Strong": {"bold": "1"}},
  "table": {"Grid": {"cells": [{"padding": "1"}, {}]}}})";

Text Exported(const StyleSheet& sheet) {
  Text text;
  sheet.ExportToString(text, true);
  return text;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static Tools::SchemaRegistration registration;
  if (!registration.active) {
    Tools::SchemaError error;
    FUZZ_CHECK(Tools::RegisterSchema(Tools::DefaultSchema(), registration, error));
  }
  const Text text(
      ZelPlatform::Utf8ToUtf16(std::string_view(reinterpret_cast<const char*>(data), size)));
  const bool replace = size % 2 == 1;
  Tools::ValidateDocument(text);

  StyleSheet target;
  FUZZ_CHECK(target.ImportFromString(kSeed, false));
  const Text before = Exported(target);
  std::vector<Tools::Diagnostic> checked;
  if (!Tools::ImportChecked(target, text, replace, &checked)) {
    FUZZ_CHECK(Exported(target) == before);
    return 0;
  }
  FUZZ_CHECK(!Tools::HasErrors(checked));
  StyleSheet plain;
  FUZZ_CHECK(plain.ImportFromString(kSeed, false));
  try {
    FUZZ_CHECK(plain.ImportFromString(text, replace));
  } catch (const std::exception&) {
    FUZZ_CHECK(!"a checked import succeeded where the plain import threw");
  }
  FUZZ_CHECK(Exported(plain) == Exported(target));
  FUZZ_CHECK(plain.GetVersion() == target.GetVersion());
  return 0;
}
