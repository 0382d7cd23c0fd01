// Import of one long inheritance chain written root first, the shape that
// made cycle checks quadratic: time per style must stay flat from 10k to 200k
// styles. RapidJSON's own DOM parse of the same text runs beside it as the
// floor to compare with.
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <ZelPref/ConversionPolicy.h>

#include <benchmark/benchmark.h>
#include <rapidjson/document.h>
#include <rapidjson/encodings.h>

#include <cstdint>
#include <string>

namespace {

using Styles::PropertyKey;
using Text = ZelStringT<char16_t>;
using Utf16 = rapidjson::UTF16<char16_t>;

const PropertyKey kChainCategory(u"chainParagraph");
const PropertyKey kSize(u"fontSize");

bool IsNumber(const ZelUtils::Any& value) { return value.GetIf<double>() != nullptr; }

void RegisterCategory() {
  static const bool registered = [] {
    Styles::StyleManager& manager = Styles::GetStyleManager();
    manager.SetCurrentVersion(1);
    manager.RegisterCategory(kChainCategory, u"Paragraph", false, false);
    manager.RegisterProperty(kChainCategory, kSize,
                             new Styles::StyleProperty(ZelUtils::Any(0.0),
                                                       new ZelPref::NumberConversionPolicy,
                                                       &IsNumber));
    return true;
  }();
  (void)registered;
}

// `count` styles, each inheriting from the one before, root first; every
// tenth sets the size.
Text MakeChain(std::int64_t count) {
  const auto name = [](std::int64_t i) {
    return u"Level " +
           std::u16string(Text::FormatInternal("%lld", static_cast<long long>(i)).GetView());
  };
  std::u16string text = u"{\"chainParagraph\": {";
  for (std::int64_t i = 0; i < count; ++i) {
    text += (i ? u",\"" : u"\"") + name(i) + u"\": {";
    if (i)
      text += u"\"inherits\": \"" + name(i - 1) + u"\"";
    if (i % 10 == 0)
      text += std::u16string(i ? u", " : u"") + u"\"fontSize\": \"12\"";
    text += u"}";
  }
  text += u"}}";
  return Text(std::move(text));
}

void Report(benchmark::State& state, const Text& text) {
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.GetLength() * 2));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

// Includes destroying the sheet, which every real import pays for.
void BM_ImportChainRootFirst(benchmark::State& state) {
  RegisterCategory();
  const Text text = MakeChain(state.range(0));
  for (auto _ : state) {
    Styles::StyleSheet sheet;
    const bool imported = sheet.ImportFromString(text, true);
    benchmark::DoNotOptimize(imported);
  }
  Report(state, text);
}

void BM_RawRapidJsonDomParseChain(benchmark::State& state) {
  const Text text = MakeChain(state.range(0));
  for (auto _ : state) {
    rapidjson::GenericDocument<Utf16> document;
    document.Parse<rapidjson::kParseValidateEncodingFlag>(text.c_str());
    benchmark::DoNotOptimize(document.HasParseError());
  }
  Report(state, text);
}

} // namespace

BENCHMARK(BM_ImportChainRootFirst)
    ->Arg(10000)
    ->Arg(100000)
    ->Arg(200000)
    ->Unit(benchmark::kMillisecond);
BENCHMARK(BM_RawRapidJsonDomParseChain)
    ->Arg(10000)
    ->Arg(100000)
    ->Arg(200000)
    ->Unit(benchmark::kMillisecond);
