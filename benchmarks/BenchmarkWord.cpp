// Reading Word's default template (164 styles, 649 table conditional formats)
// into a sheet, beside the plain baseline of pugixml parsing its styles part
// alone; and writing the sheet back as a styles part. The ratio of reading to
// the bare parse is what the reader adds: unzipping, mapping every element,
// the raw copies and the sheet itself. The file comes from the shared corpus
// (STYLES_WORD_CORPUS).
#include <StylesWord/WordFile.h>
#include <StylesWord/WordSchema.h>

#include <Styles/StyleSheet.h>

#include <benchmark/benchmark.h>
#include <pugixml.hpp>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace {

std::string Slurp(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream out;
  out << in.rdbuf();
  return out.str();
}

const std::string& Template() {
  static const std::string bytes =
      Slurp(std::string(STYLES_WORD_CORPUS) + "/word-default-template.docx");
  return bytes;
}

const std::string& StylesPart() {
  static const std::string xml = [] {
    std::string text;
    Styles::Word::Problem problem;
    Styles::Word::ReadStylesPart(Template(), text, problem);
    return text;
  }();
  return xml;
}

// The Word schema, registered once for the whole run.
void RegisterWord() {
  static Styles::Tools::SchemaRegistration registration;
  if (registration.active)
    return;
  Styles::Tools::SchemaError error;
  Styles::Tools::RegisterSchema(Styles::Word::WordSchema(), registration, error);
}

void SetCounters(benchmark::State& state, std::size_t bytes) {
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes));
  state.counters["styles/s"] = benchmark::Counter(164.0 * static_cast<double>(state.iterations()),
                                                  benchmark::Counter::kIsRate);
}

void BM_ReadWordTemplate(benchmark::State& state) {
  RegisterWord();
  if (Template().empty()) {
    state.SkipWithError("the corpus file is missing");
    return;
  }
  for (auto _ : state) {
    Styles::StyleSheet sheet;
    Styles::Word::ReadReport report;
    benchmark::DoNotOptimize(Styles::Word::ReadWord(Template(), sheet, report));
  }
  SetCounters(state, StylesPart().size());
}
BENCHMARK(BM_ReadWordTemplate)->Unit(benchmark::kMillisecond);

void BM_PugixmlParseStylesPart(benchmark::State& state) {
  if (StylesPart().empty()) {
    state.SkipWithError("the corpus file is missing");
    return;
  }
  for (auto _ : state) {
    pugi::xml_document document;
    benchmark::DoNotOptimize(document.load_buffer(StylesPart().data(), StylesPart().size()));
  }
  SetCounters(state, StylesPart().size());
}
BENCHMARK(BM_PugixmlParseStylesPart)->Unit(benchmark::kMillisecond);

void BM_WriteWordStylesPart(benchmark::State& state) {
  RegisterWord();
  Styles::StyleSheet sheet;
  Styles::Word::ReadReport report;
  if (!Styles::Word::ReadWord(Template(), sheet, report)) {
    state.SkipWithError("the corpus file cannot be read");
    return;
  }
  for (auto _ : state)
    benchmark::DoNotOptimize(Styles::Word::WriteStylesPart(sheet));
  SetCounters(state, StylesPart().size());
}
BENCHMARK(BM_WriteWordStylesPart)->Unit(benchmark::kMillisecond);

// Reading each file of the corpus, package and all; the styles read are a counter.
const bool g_corpusRegistered = [] {
  std::error_code error;
  for (const auto& entry :
       std::filesystem::directory_iterator(std::string(STYLES_WORD_CORPUS), error)) {
    if (entry.path().extension() != ".docx" && entry.path().extension() != ".dotx")
      continue;
    const std::string path = entry.path().string();
    benchmark::RegisterBenchmark(("BM_ReadWordFile/" + entry.path().filename().string()).c_str(),
                                 [path](benchmark::State& state) {
                                   RegisterWord();
                                   const std::string bytes = Slurp(path);
                                   double styles = 0;
                                   for (auto _ : state) {
                                     Styles::StyleSheet sheet;
                                     Styles::Word::ReadReport report;
                                     Styles::Word::ReadWord(bytes, sheet, report);
                                     styles = 0;
                                     for (const Styles::Style* style : sheet.GetStyles())
                                       styles += Styles::Word::IsPartStyle(sheet, style) ? 0 : 1;
                                   }
                                   state.counters["styles"] = styles;
                                 })
        ->Unit(benchmark::kMillisecond);
  }
  return true;
}();

} // namespace
