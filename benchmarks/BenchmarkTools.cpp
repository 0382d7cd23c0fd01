// What the styles command costs on large documents: validating one, reading
// it all or nothing, and answering "show --explain" for the style at the end
// of the longest chain (read, find, resolve every effective value). The
// documents use the built-in schema: paragraphs in chains of a hundred, a
// fifth of them with a character substyle, some of those based on one of the
// character styles that make up a fifth of the sheet. Last, "diff --effective"
// of two versions of one long chain, from 5k to 40k styles, whose time must
// grow as the chain does: the summary gives the factor from 5k to 40k.
#include <StylesTools/Diagnostics.h>
#include <StylesTools/Diff.h>
#include <StylesTools/Provenance.h>
#include <StylesTools/Schema.h>

#include <Styles/Style.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>

#include <benchmark/benchmark.h>

#include <cstdio>
#include <map>
#include <string>
#include <utility>
#include <vector>

namespace {

using Text = ZelStringT<char16_t>;

void RegisterDefaultSchema() {
  static const bool registered = [] {
    static Styles::Tools::SchemaRegistration registration;
    Styles::Tools::SchemaError error;
    return Styles::Tools::RegisterSchema(Styles::Tools::DefaultSchema(), registration, error);
  }();
  (void)registered;
}

// A document of `count` styles; the last paragraph ends a chain of 100.
Text MakeDocument(int count) {
  const int characters = count / 5;
  const int paragraphs = count - characters;
  std::string text = "{\"version\":1,\"character\":{";
  char buffer[256];
  for (int i = 0; i < characters; ++i) {
    std::snprintf(buffer, sizeof buffer, "%s\"C%d\":{\"fontSize\":\"%d\"", i ? "," : "", i,
                  8 + i % 20);
    text += buffer;
    if (i > 0) {
      std::snprintf(buffer, sizeof buffer, ",\"inherits\":\"C%d\"", (i * 7919) % i);
      text += buffer;
    }
    text += "}";
  }
  text += "},\"paragraph\":{";
  for (int i = 0; i < paragraphs; ++i) {
    std::snprintf(buffer, sizeof buffer, "%s\"P%d\":{\"spaceAfter\":\"%d\"", i ? "," : "", i,
                  i % 13);
    text += buffer;
    if (i % 100 != 0) {
      std::snprintf(buffer, sizeof buffer, ",\"inherits\":\"P%d\"", i - 1);
      text += buffer;
    }
    if (i % 5 == 0) {
      std::snprintf(buffer, sizeof buffer,
                    ",\"character\":{\"fontName\":\"F%d\",\"colour\":\"#00AA%02X\"", i, i % 256);
      text += buffer;
      if (i % 3 == 0 && characters > 0) {
        std::snprintf(buffer, sizeof buffer, ",\"inherits\":\"C%d\"", i % characters);
        text += buffer;
      }
      text += "}";
    }
    text += "}";
  }
  text += "}}";
  return Text(ZelPlatform::Utf8ToUtf16(text));
}

void SetStylesPerSecond(benchmark::State& state) {
  state.counters["styles/s"] = benchmark::Counter(
      static_cast<double>(state.iterations() * state.range(0)), benchmark::Counter::kIsRate);
}

void BM_ValidateDocument(benchmark::State& state) {
  RegisterDefaultSchema();
  const Text text = MakeDocument(static_cast<int>(state.range(0)));
  for (auto _ : state) {
    const auto diagnostics = Styles::Tools::ValidateDocument(text);
    if (!diagnostics.empty())
      state.SkipWithError("the document should be clean");
    benchmark::DoNotOptimize(diagnostics.data());
  }
  SetStylesPerSecond(state);
}
BENCHMARK(BM_ValidateDocument)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);

void BM_ImportChecked(benchmark::State& state) {
  RegisterDefaultSchema();
  const Text text = MakeDocument(static_cast<int>(state.range(0)));
  for (auto _ : state) {
    Styles::StyleSheet sheet;
    if (!Styles::Tools::ImportChecked(sheet, text, true, nullptr))
      state.SkipWithError("the import should succeed");
  }
  SetStylesPerSecond(state);
}
BENCHMARK(BM_ImportChecked)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);

// The work of "styles show DOC STYLE --explain" once the file is in memory:
// parse, keep what the style depends on, read that all or nothing, resolve.
void BM_ShowExplain(benchmark::State& state) {
  RegisterDefaultSchema();
  const int count = static_cast<int>(state.range(0));
  const Text text = MakeDocument(count);
  const Text last(ZelPlatform::Utf8ToUtf16("P" + std::to_string(count - count / 5 - 1)));
  for (auto _ : state) {
    Text part, error;
    {
      Json::Document document;
      document.ParseBorrowed(text, error);
      part = Styles::Tools::SelectStylesText(document, {last});
    }
    Styles::StyleSheet sheet;
    if (!Styles::Tools::ImportChecked(sheet, std::move(part), true, nullptr))
      state.SkipWithError("the import should succeed");
    const Styles::Style* style = sheet.GetStyle(last);
    const auto values = Styles::Tools::ListEffectiveValues(*style);
    for (const auto& value : values)
      benchmark::DoNotOptimize(Styles::Tools::DescribeStyle(sheet, value.resolution.holder));
  }
  SetStylesPerSecond(state);
}
BENCHMARK(BM_ShowExplain)->Arg(10000)->Arg(100000)->Unit(benchmark::kMillisecond);

// One chain of `count` paragraphs, each inheriting from the one before; only
// the root sets spaceAfter, so changing it changes every style's effective value.
Text MakeChain(int count, int rootValue) {
  std::string text =
      "{\"version\":1,\"paragraph\":{\"P0\":{\"spaceAfter\":\"" + std::to_string(rootValue) + "\"}";
  for (int i = 1; i < count; ++i)
    text += ",\"P" + std::to_string(i) + "\":{\"inherits\":\"P" + std::to_string(i - 1) + "\"}";
  text += "}}";
  return Text(ZelPlatform::Utf8ToUtf16(text));
}

void BM_DiffEffectiveChain(benchmark::State& state) {
  RegisterDefaultSchema();
  const int count = static_cast<int>(state.range(0));
  Styles::StyleSheet oldSheet, newSheet;
  if (!oldSheet.ImportFromString(MakeChain(count, 1), true) ||
      !newSheet.ImportFromString(MakeChain(count, 2), true))
    state.SkipWithError("the chains should import");
  for (auto _ : state) {
    const auto differences = Styles::Tools::DiffSheets(oldSheet, newSheet, true);
    if (differences.size() != static_cast<std::size_t>(count))
      state.SkipWithError("every style should differ once");
    benchmark::DoNotOptimize(differences.data());
  }
  SetStylesPerSecond(state);
}
BENCHMARK(BM_DiffEffectiveChain)
    ->Arg(5000)
    ->Arg(10000)
    ->Arg(20000)
    ->Arg(40000)
    ->Unit(benchmark::kMillisecond);

// Keeps the chain diff's CPU times for the summary: on a shared machine they
// move less than wall-clock times.
class ChainReporter : public benchmark::ConsoleReporter {
public:
  void ReportRuns(const std::vector<Run>& runs) override {
    ConsoleReporter::ReportRuns(runs);
    for (const Run& run : runs)
      if (!run.error_occurred && run.run_type == Run::RT_Iteration)
        m_times[run.run_name.str()] = run.GetAdjustedCPUTime();
  }
  void PrintSummary() const {
    const auto small = m_times.find("BM_DiffEffectiveChain/5000");
    const auto large = m_times.find("BM_DiffEffectiveChain/40000");
    if (small != m_times.end() && large != m_times.end())
      std::printf("\ndiff --effective of a chain, 8x the styles (5k to 40k): %.1fx the CPU "
                  "time (8x is linear, 64x quadratic)\n",
                  large->second / small->second);
  }

private:
  std::map<std::string, double> m_times;
};

} // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv))
    return 1;
  ChainReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  reporter.PrintSummary();
  benchmark::Shutdown();
  return 0;
}
