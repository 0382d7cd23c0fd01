// Import and export throughput of a style sheet document, next to the raw
// RapidJSON parse and write of the same text as the floor to compare with.
// Sizes are numbers of styles; bytes are UTF-16 code units times two.
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <ZelPref/ConversionPolicy.h>

#include <benchmark/benchmark.h>
#include <rapidjson/document.h>
#include <rapidjson/encodings.h>
#include <rapidjson/reader.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>

#include <cstdint>
#include <memory>

namespace {

using Styles::PropertyKey;
using Styles::Style;
using Styles::StyleSheet;
using Text = ZelStringT<char16_t>;
using Utf16 = rapidjson::UTF16<char16_t>;

const PropertyKey kParagraph(u"benchParagraph");
const PropertyKey kCharacter(u"benchCharacter");
const PropertyKey kSize(u"fontSize");
const PropertyKey kFont(u"fontName");
const PropertyKey kColour(u"colour");
const PropertyKey kSpacing(u"spaceAfter");

bool IsNumber(const ZelUtils::Any& value) { return value.GetIf<double>() != nullptr; }
bool IsText(const ZelUtils::Any& value) { return value.GetIf<Text>() != nullptr; }

// Registers the two categories once for the whole program.
void RegisterCategories() {
  static const bool registered = [] {
    Styles::StyleManager& manager = Styles::GetStyleManager();
    manager.SetCurrentVersion(1);
    for (const PropertyKey& category : {kParagraph, kCharacter}) {
      manager.RegisterCategory(category, category.GetString(), false, false);
      for (const PropertyKey& number : {kSize, kSpacing})
        manager.RegisterProperty(category, number,
                                 new Styles::StyleProperty(ZelUtils::Any(0.0),
                                                           new ZelPref::NumberConversionPolicy,
                                                           &IsNumber));
      for (const PropertyKey& text : {kFont, kColour})
        manager.RegisterProperty(category, text,
                                 new Styles::StyleProperty(ZelUtils::Any(Text()),
                                                           new ZelPref::TextConversionPolicy,
                                                           &IsText));
    }
    return true;
  }();
  (void)registered;
}

// A sheet of `count` styles in chains of ten, alternating categories.
std::unique_ptr<StyleSheet> MakeSheet(std::int64_t count) {
  RegisterCategories();
  auto sheet = std::make_unique<StyleSheet>();
  Style* previous = nullptr;
  for (std::int64_t i = 0; i < count; ++i) {
    Style* style = new Style(i % 10 == 0 ? nullptr : previous, i % 2 ? kCharacter : kParagraph);
    style->SetProperty(kSize, 8.0 + static_cast<double>(i % 17) * 0.5);
    style->SetProperty(kSpacing, static_cast<double>(i % 5));
    style->SetProperty(kFont, Text(u"Garamond Premier Pro"));
    if (i % 3 == 0)
      style->SetProperty(kColour, Text(u"#1f3a5c"));
    sheet->AddStyle(Text::FormatInternal("Style number %lld", static_cast<long long>(i)), style,
                    false);
    previous = style;
  }
  return sheet;
}

Text MakeText(std::int64_t count) {
  Text text;
  MakeSheet(count)->ExportToString(text, false);
  return text;
}

void Report(benchmark::State& state, const Text& text) {
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.GetLength() * 2));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_ExportSheet(benchmark::State& state) {
  const std::unique_ptr<StyleSheet> sheet = MakeSheet(state.range(0));
  Text text;
  for (auto _ : state) {
    sheet->ExportToString(text, false);
    benchmark::DoNotOptimize(text.data());
  }
  Report(state, text);
}

// Includes destroying the imported styles, which every real import pays for.
void BM_ImportSheet(benchmark::State& state) {
  const Text text = MakeText(state.range(0));
  for (auto _ : state) {
    StyleSheet sheet;
    const bool imported = sheet.ImportFromString(text, true);
    benchmark::DoNotOptimize(imported);
  }
  Report(state, text);
}

void BM_RawRapidJsonParse(benchmark::State& state) {
  const Text text = MakeText(state.range(0));
  for (auto _ : state) {
    rapidjson::GenericReader<Utf16, Utf16> reader;
    rapidjson::GenericStringStream<Utf16> stream(text.c_str());
    rapidjson::BaseReaderHandler<Utf16> handler;
    const rapidjson::ParseResult result = reader.Parse(stream, handler);
    benchmark::DoNotOptimize(result);
  }
  Report(state, text);
}

void BM_RawRapidJsonWrite(benchmark::State& state) {
  const Text text = MakeText(state.range(0));
  rapidjson::GenericDocument<Utf16> document;
  document.Parse(text.c_str());
  for (auto _ : state) {
    rapidjson::GenericStringBuffer<Utf16> buffer;
    rapidjson::Writer<rapidjson::GenericStringBuffer<Utf16>, Utf16, Utf16> writer(buffer);
    document.Accept(writer);
    benchmark::DoNotOptimize(buffer.GetString());
  }
  Report(state, text);
}

} // namespace

BENCHMARK(BM_ExportSheet)->RangeMultiplier(10)->Range(100, 10000)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_ImportSheet)->RangeMultiplier(10)->Range(100, 10000)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_RawRapidJsonParse)
    ->RangeMultiplier(10)
    ->Range(100, 10000)
    ->Unit(benchmark::kMillisecond);
BENCHMARK(BM_RawRapidJsonWrite)
    ->RangeMultiplier(10)
    ->Range(100, 10000)
    ->Unit(benchmark::kMillisecond);
