// Import and export throughput of a style sheet document, next to the raw
// RapidJSON parse and write of the same text as the floor to compare with.
// Sizes are numbers of styles; bytes are UTF-16 code units times two. Each
// size runs on a plain document and on one where a fifth of the styles own a
// substyle and a twentieth a list of two to four substyles.
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>

#include <ZelPref/ConversionPolicy.h>

#include <benchmark/benchmark.h>
#include <rapidjson/document.h>
#include <rapidjson/encodings.h>
#include <rapidjson/reader.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>

#include <cstdint>
#include <memory>
#include <vector>

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
const PropertyKey kRuns(u"runs");

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
      // One character substyle (keyed by its category) and a list of them.
      Styles::RegisterSubstyleSet(category, kCharacter);
      manager.RegisterProperty(category, kRuns, new Styles::StyleArrayProperty(kCharacter));
    }
    return true;
  }();
  (void)registered;
}

// A sheet of `count` styles in chains of ten, alternating categories. With
// `substyles`, every fifth style owns a character substyle and every
// twentieth a list of two to four of them.
std::unique_ptr<StyleSheet> MakeSheet(std::int64_t count, bool substyles) {
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
    if (substyles && i % 5 == 0) {
      style->SetPathProperty({kCharacter, kSize}, ZelUtils::Any(9.5));
      style->SetPathProperty({kCharacter, kFont}, ZelUtils::Any(Text(u"Minion Pro")));
    }
    if (substyles && i % 20 == 1) {
      Style run(nullptr, kCharacter);
      run.SetProperty(kColour, Text(u"#8b0000"));
      run.SetProperty(kSize, 7.0);
      // The style stores copies of the list's substyles.
      style->SetProperty(kRuns, std::vector<Style*>(2 + static_cast<std::size_t>(i % 3), &run));
    }
    sheet->AddStyle(Text::FormatInternal("Style number %lld", static_cast<long long>(i)), style,
                    false);
    previous = style;
  }
  return sheet;
}

Text MakeText(std::int64_t count, bool substyles) {
  Text text;
  MakeSheet(count, substyles)->ExportToString(text, false);
  return text;
}

void Report(benchmark::State& state, const Text& text) {
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.GetLength() * 2));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_ExportSheet(benchmark::State& state) {
  const std::unique_ptr<StyleSheet> sheet = MakeSheet(state.range(0), state.range(1) != 0);
  Text text;
  for (auto _ : state) {
    sheet->ExportToString(text, false);
    benchmark::DoNotOptimize(text.data());
  }
  Report(state, text);
}

// Includes destroying the imported styles, which every real import pays for.
void BM_ImportSheet(benchmark::State& state) {
  const Text text = MakeText(state.range(0), state.range(1) != 0);
  for (auto _ : state) {
    StyleSheet sheet;
    const bool imported = sheet.ImportFromString(text, true);
    benchmark::DoNotOptimize(imported);
  }
  Report(state, text);
}

void BM_RawRapidJsonParse(benchmark::State& state) {
  const Text text = MakeText(state.range(0), state.range(1) != 0);
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
  const Text text = MakeText(state.range(0), state.range(1) != 0);
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

// Sizes 100 to 10,000 styles, each without and with substyles.
void SheetSizes(benchmark::internal::Benchmark* family) {
  family->ArgsProduct({benchmark::CreateRange(100, 10000, 10), {0, 1}})
      ->ArgNames({"styles", "substyles"})
      ->Unit(benchmark::kMillisecond);
}

} // namespace

BENCHMARK(BM_ExportSheet)->Apply(SheetSizes);
BENCHMARK(BM_ImportSheet)->Apply(SheetSizes);
BENCHMARK(BM_RawRapidJsonParse)->Apply(SheetSizes);
BENCHMARK(BM_RawRapidJsonWrite)->Apply(SheetSizes);
