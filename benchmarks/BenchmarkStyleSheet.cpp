// Sheet documents at 1k, 10k and 100k styles, each beside a plain baseline on
// the same data in the same run: import against RapidJSON's UTF-16 DOM parse,
// export against RapidJSON's Writer over that DOM, DeleteStyles of a fixed set
// at two sizes, a lookup answered by the 4th parent against the same walk over
// plain structs, and the memory one import takes at its peak and keeps. The
// documents model a word processor: 4 to 12 properties a style, 70% of styles
// with a parent, a third of the names non-ASCII; the "substyles" variant gives
// a fifth of the styles a character substyle and a twentieth a list of two to
// four. After the runs a summary prints every ratio the project tracks.
#include <Styles/Styles.h>

#include <ZelPref/ConversionPolicy.h>

#include <benchmark/benchmark.h>
#include <malloc.h>
#include <rapidjson/document.h>
#include <rapidjson/encodings.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <memory>
#include <new>
#include <random>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "CountingAllocator.h"

namespace {

using Styles::PropertyKey;
using Styles::Style;
using Styles::StyleSheet;
using Text = ZelStringT<char16_t>;
using Utf16 = rapidjson::UTF16<char16_t>;
using ZelUtils::Any;

const PropertyKey kParagraph(u"paragraph");
const PropertyKey kCharacter(u"character");
const PropertyKey kCells(u"cells");

struct PropertySpec {
  const char16_t* name;
  bool number;
};
// The properties both categories register, in the order styles set them.
const PropertySpec kProperties[] = {
    {u"fontName", false},  {u"fontSize", true},   {u"colour", false},    {u"spaceBefore", true},
    {u"spaceAfter", true}, {u"lineHeight", true}, {u"indentLeft", true}, {u"indentRight", true},
    {u"alignment", false}, {u"bold", true},       {u"italic", true},     {u"tracking", true},
};

bool IsNumber(const Any& value) { return value.GetIf<double>() != nullptr; }
bool IsText(const Any& value) { return value.GetIf<Text>() != nullptr; }

void RegisterCategories() {
  static const bool registered = [] {
    Styles::StyleManager& manager = Styles::GetStyleManager();
    manager.SetCurrentVersion(1);
    for (const PropertyKey& category : {kParagraph, kCharacter}) {
      manager.RegisterCategory(category, category.GetString(), false, false);
      for (const PropertySpec& property : kProperties) {
        if (property.number)
          manager.RegisterProperty(
              category, property.name,
              new Styles::StyleProperty(Any(0.0), new ZelPref::NumberConversionPolicy, &IsNumber));
        else
          manager.RegisterProperty(
              category, property.name,
              new Styles::StyleProperty(Any(Text()), new ZelPref::TextConversionPolicy, &IsText));
      }
    }
    Styles::RegisterSubstyleSet(kParagraph, kCharacter);
    manager.RegisterProperty(kParagraph, kCells, new Styles::StyleArrayProperty(kCharacter));
    return true;
  }();
  (void)registered;
}

const Text kFonts[] = {u"Garamond Premier Pro", u"Avenir Next", u"Minion Pro", u"Source Serif"};
const Text kAlignments[] = {u"left", u"justify", u"centre"};

// Sets `count` of the properties on `style`, with values drawn from `random`.
void SetValues(Style& style, std::size_t count, std::mt19937& random) {
  for (std::size_t k = 0; k < count; ++k) {
    const PropertySpec& property = kProperties[k];
    if (!property.number)
      style.SetProperty(property.name,
                        Any(k == 0   ? kFonts[random() % 4]
                            : k == 2 ? Text::FormatInternal("#%06x", random() % 0xFFFFFF)
                                     : kAlignments[random() % 3]));
    else
      style.SetProperty(property.name, Any(static_cast<double>(random() % 400) / 4));
  }
}

std::unique_ptr<StyleSheet> MakeSheet(std::int64_t count, bool substyles) {
  RegisterCategories();
  std::mt19937 random(20261123);
  auto sheet = std::make_unique<StyleSheet>();
  std::vector<Style*> made;
  for (std::int64_t i = 0; i < count; ++i) {
    const bool paragraph = i % 4 != 3;
    Style* parent = nullptr;
    if (random() % 10 < 7 && !made.empty()) {
      // A recent style of the same category, so that chains grow a few deep.
      const std::size_t back = 1 + random() % std::min<std::size_t>(made.size(), 8);
      Style* candidate = made[made.size() - back];
      if (candidate->GetCategoryName() == (paragraph ? kParagraph : kCharacter))
        parent = candidate;
    }
    Style* style = new Style(parent, paragraph ? kParagraph : kCharacter);
    SetValues(*style, 4 + random() % 9, random);
    if (substyles && paragraph && i % 5 == 0) {
      Style run(nullptr, kCharacter);
      SetValues(run, 2 + random() % 3, random);
      style->SetProperty(kCharacter, Any(static_cast<const Style*>(&run)));
    }
    if (substyles && paragraph && i % 20 == 1) {
      Style cell(nullptr, kCharacter);
      SetValues(cell, 3, random);
      // The style stores copies of the list's substyles.
      style->SetProperty(kCells, std::vector<Style*>(2 + random() % 3, &cell));
    }
    const Text name = (i % 3 == 0 ? Text(u"\u00dcberschrift ") : Text(u"Body Text ")) +
                      Text::FormatInternal("%lld", static_cast<long long>(i));
    sheet->AddStyle(name, style, false);
    made.push_back(style);
  }
  return sheet;
}

// Documents are made once per size and variant and kept for the whole run.
const Text& Document(std::int64_t count, bool substyles) {
  static std::map<std::pair<std::int64_t, bool>, Text> documents;
  Text& text = documents[{count, substyles}];
  if (text.IsEmpty())
    MakeSheet(count, substyles)->ExportToString(text, false);
  return text;
}

void Report(benchmark::State& state, const Text& text) {
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.GetLength() * 2));
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

// Includes destroying the sheet, which every real import pays for.
void BM_Import(benchmark::State& state) {
  const Text& text = Document(state.range(0), state.range(1) != 0);
  for (auto _ : state) {
    StyleSheet sheet;
    benchmark::DoNotOptimize(sheet.ImportFromString(text, true));
  }
  Report(state, text);
}

void BM_RapidJsonParse(benchmark::State& state) {
  const Text& text = Document(state.range(0), state.range(1) != 0);
  for (auto _ : state) {
    rapidjson::GenericDocument<Utf16> document;
    document.Parse<rapidjson::kParseValidateEncodingFlag | rapidjson::kParseFullPrecisionFlag>(
        text.c_str());
    benchmark::DoNotOptimize(document.HasParseError());
  }
  Report(state, text);
}

void BM_Export(benchmark::State& state) {
  StyleSheet sheet;
  const Text& text = Document(state.range(0), state.range(1) != 0);
  sheet.ImportFromString(text, true);
  Text written;
  for (auto _ : state) {
    sheet.ExportToString(written, false);
    benchmark::DoNotOptimize(written.data());
  }
  Report(state, text);
}

void BM_RapidJsonWrite(benchmark::State& state) {
  const Text& text = Document(state.range(0), state.range(1) != 0);
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

// Deletes the same 100 styles (every hundredth of the first 10,000) from a
// freshly imported sheet; only the deletion is timed.
void BM_DeleteStyles(benchmark::State& state) {
  const Text& text = Document(state.range(0), false);
  for (auto _ : state) {
    state.PauseTiming();
    auto sheet = std::make_unique<StyleSheet>();
    sheet->ImportFromString(text, true);
    const std::vector<Style*> styles = sheet->GetStyles();
    std::vector<Style*> doomed;
    for (std::size_t i = 0; i < 10000 && i < styles.size(); i += 100)
      doomed.push_back(styles[i]);
    state.ResumeTiming();
    sheet->DeleteStyles(Styles::StyleSpan(doomed, false));
    state.PauseTiming();
    sheet.reset();
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * 100);
}

// Chains five deep where only the root sets the looked-up key; each style
// also sets eight other keys. Leaves are visited in shuffled order.
constexpr int kChains = 20000;
constexpr int kDepth = 4;

// The plain baseline: a node per style with a parent pointer and a sorted
// vector of (interned key pointer, number) pairs, scanned linearly.
struct PlainStyle {
  const PlainStyle* parent = nullptr;
  std::vector<std::pair<const void*, double>> values; // sorted by key
};

struct LookupData {
  LookupData() {
    RegisterCategories();
    std::mt19937 random(4);
    for (int c = 0; c < kChains; ++c) {
      Style* parent = nullptr;
      const PlainStyle* plainParent = nullptr;
      for (int level = 0; level <= kDepth; ++level) {
        styles.emplace_back(new Style(parent, kParagraph));
        plain.emplace_back(new PlainStyle);
        Style& style = *styles.back();
        PlainStyle& mirror = *plain.back();
        mirror.parent = plainParent;
        for (int k = 1; k < 12; ++k) {
          if (!kProperties[k].number || (level > 0 && k == 1))
            continue;
          const double value = static_cast<double>(random() % 100);
          style.SetProperty(kProperties[k].name, Any(value));
          mirror.values.emplace_back(&PropertyKey(kProperties[k].name).GetString(), value);
        }
        std::sort(mirror.values.begin(), mirror.values.end());
        parent = &style;
        plainParent = &mirror;
      }
      leaves.push_back(parent);
      plainLeaves.push_back(plainParent);
    }
    std::vector<std::size_t> order(leaves.size());
    for (std::size_t i = 0; i < order.size(); ++i)
      order[i] = i;
    std::shuffle(order.begin(), order.end(), random);
    std::vector<const Style*> shuffled;
    std::vector<const PlainStyle*> plainShuffled;
    for (const std::size_t i : order) {
      shuffled.push_back(leaves[i]);
      plainShuffled.push_back(plainLeaves[i]);
    }
    leaves.swap(shuffled);
    plainLeaves.swap(plainShuffled);
  }
  std::vector<std::unique_ptr<Style>> styles;
  std::vector<std::unique_ptr<PlainStyle>> plain;
  std::vector<const Style*> leaves;
  std::vector<const PlainStyle*> plainLeaves;
};

const LookupData& Lookups() {
  static const LookupData data;
  return data;
}

void BM_LookupFourthParent(benchmark::State& state) {
  const LookupData& data = Lookups();
  const PropertyKey key(kProperties[1].name);
  std::size_t i = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(&data.leaves[i]->GetProperty(key));
    i = i + 1 == data.leaves.size() ? 0 : i + 1;
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_PlainWalkFourthParent(benchmark::State& state) {
  const LookupData& data = Lookups();
  const void* key = &PropertyKey(kProperties[1].name).GetString();
  std::size_t i = 0;
  for (auto _ : state) {
    const double* found = nullptr;
    // Each style's sorted pairs are scanned from the front, up to the key's place.
    for (const PlainStyle* style = data.plainLeaves[i]; style && !found; style = style->parent)
      for (const std::pair<const void*, double>& value : style->values) {
        if (value.first >= key) {
          found = value.first == key ? &value.second : nullptr;
          break;
        }
      }
    benchmark::DoNotOptimize(found);
    i = i + 1 == data.plainLeaves.size() ? 0 : i + 1;
  }
  state.SetItemsProcessed(state.iterations());
}

// Bytes in use at the peak of one import, and kept by the sheet afterwards,
// each as a multiple of the document's UTF-16 size.
void BM_ImportMemory(benchmark::State& state) {
  const Text& text = Document(state.range(0), state.range(1) != 0);
  double peak = 0, kept = 0;
  for (auto _ : state) {
    const std::size_t before = g_bytesInUse;
    g_peakBytes = before;
    auto sheet = std::make_unique<StyleSheet>();
    sheet->ImportFromString(text, true);
    kept = static_cast<double>(g_bytesInUse - before);
    peak = static_cast<double>(g_peakBytes - before);
    sheet.reset();
  }
  const double bytes = static_cast<double>(text.GetLength() * 2);
  state.counters["peak_x_text"] = peak / bytes;
  state.counters["kept_x_text"] = kept / bytes;
}

void Sizes(benchmark::internal::Benchmark* family) {
  family->ArgsProduct({{1000, 10000, 100000}, {0, 1}})
      ->ArgNames({"styles", "substyles"})
      ->Unit(benchmark::kMillisecond);
}

// Keeps every run so that the summary can set them side by side.
class SummaryReporter : public benchmark::ConsoleReporter {
public:
  void ReportRuns(const std::vector<Run>& runs) override {
    ConsoleReporter::ReportRuns(runs);
    // With --benchmark_repetitions the medians stand for their benchmarks.
    for (const Run& run : runs) {
      if (run.error_occurred)
        continue;
      if (run.run_type == Run::RT_Iteration && !m_medians.count(run.run_name.str()))
        m_runs[run.run_name.str()] = run;
      else if (run.run_type == Run::RT_Aggregate && run.aggregate_name == "median") {
        m_runs[run.run_name.str()] = run;
        m_medians.insert(run.run_name.str());
      }
    }
  }

  bool HasRuns() const { return !m_runs.empty(); }

  // One table row per tracked figure: what was measured, the goal, and
  // whether this run meets it. A figure whose runs were filtered out shows
  // as not run.
  void PrintSummary() const {
    std::printf("\nSummary: ratios of CPU times from this one run, which move less than wall "
                "times on a shared machine\n");
    std::printf("%-62s %-26s %-18s %s\n", "figure", "measured", "goal", "met");
    for (const char* variant : {"0", "1"}) {
      const std::string tail = std::string("/substyles:") + variant;
      const std::string kind = variant[0] == '1' ? "substyles" : "plain";
      for (const char* size : {"10000", "100000"}) {
        const std::string args = std::string("/styles:") + size + tail;
        const std::string where = std::string(size) + " styles, " + kind;
        AtLeast("import speed / RapidJSON's DOM parse, " + where,
                Ratio("BM_RapidJsonParse" + args, "BM_Import" + args), 0.5);
        AtLeast("export speed / RapidJSON's Writer, " + where,
                Ratio("BM_RapidJsonWrite" + args, "BM_Export" + args), 0.7);
      }
      const std::string small = "/styles:10000" + tail, large = "/styles:100000" + tail;
      for (const auto& [ours, theirs, what] :
           {std::make_tuple("BM_Import", "BM_RapidJsonParse", "import"),
            std::make_tuple("BM_Export", "BM_RapidJsonWrite", "export")}) {
        const double reference = Ratio(theirs + large, theirs + small);
        AtMost(std::string("10k -> 100k ") + what + " time (RapidJSON's " +
                   FormatRatio(reference) + "), " + kind,
               Ratio(ours + large, ours + small), 1.15 * reference);
      }
      const Run* memory = Find("BM_ImportMemory" + large + "/iterations:1");
      AtMost("100k import peak memory / UTF-16 text, " + kind,
             memory ? double(memory->counters.at("peak_x_text")) : 0.0, 2.5);
      AtMost("100k import kept memory / UTF-16 text, " + kind,
             memory ? double(memory->counters.at("kept_x_text")) : 0.0, 1.5);
    }
    AtMost("DeleteStyles of 100 styles, 10k -> 100k styles time",
           Ratio("BM_DeleteStyles/styles:100000", "BM_DeleteStyles/styles:10000"), 10.5);
    AtMost("lookup answered by the 4th parent / plain structures",
           Ratio("BM_LookupFourthParent", "BM_PlainWalkFourthParent"), 1.5);
    for (const char* size : {"10000", "100000"})
      for (const char* stem : {"BM_Import", "BM_Export"}) {
        const std::string args = std::string("/styles:") + size;
        AtMost(std::string(stem).substr(3) + " time per byte, substyles / plain, " + size + " styles",
               PerByte(stem + args), 1.0);
      }
  }

private:
  static std::string FormatRatio(double ratio) {
    char text[32];
    std::snprintf(text, sizeof text, "%.2fx", ratio);
    return text;
  }
  static void Row(const std::string& figure, double measured, const std::string& goal, bool met) {
    std::printf("%-62s %-26s %-18s %s\n", figure.c_str(),
                measured > 0 ? FormatRatio(measured).c_str() : "-", goal.c_str(),
                measured > 0 ? (met ? "yes" : "NO") : "not run");
  }
  static void AtLeast(const std::string& figure, double measured, double goal) {
    Row(figure, measured, ">= " + FormatRatio(goal), measured >= goal);
  }
  static void AtMost(const std::string& figure, double measured, double goal) {
    Row(figure, measured, "<= " + FormatRatio(goal), measured <= goal);
  }

  const Run* Find(const std::string& name) const {
    const auto found = m_runs.find(name);
    return found == m_runs.end() ? nullptr : &found->second;
  }
  // CPU time of `numerator` over that of `denominator`; 0 when one is missing.
  double Ratio(const std::string& numerator, const std::string& denominator) const {
    const Run* a = Find(numerator);
    const Run* b = Find(denominator);
    return a && b ? a->GetAdjustedCPUTime() / b->GetAdjustedCPUTime() : 0.0;
  }
  double PerByte(const std::string& stem) const {
    const Run* with = Find(stem + "/substyles:1");
    const Run* without = Find(stem + "/substyles:0");
    if (!with || !without)
      return 0.0;
    // Bytes per second already divides by the time; its inverse is time per byte.
    return without->counters.at("bytes_per_second").value /
           with->counters.at("bytes_per_second").value;
  }

  std::map<std::string, Run> m_runs;
  std::set<std::string> m_medians;
};

} // namespace

BENCHMARK(BM_RapidJsonParse)->Apply(Sizes);
BENCHMARK(BM_Import)->Apply(Sizes);
BENCHMARK(BM_RapidJsonWrite)->Apply(Sizes);
BENCHMARK(BM_Export)->Apply(Sizes);
BENCHMARK(BM_ImportMemory)->Apply(Sizes)->Iterations(1);
BENCHMARK(BM_DeleteStyles)
    ->ArgName("styles")
    ->Arg(10000)
    ->Arg(100000)
    ->Unit(benchmark::kMillisecond);
BENCHMARK(BM_LookupFourthParent);
BENCHMARK(BM_PlainWalkFourthParent);

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv))
    return 1;
  SummaryReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  if (reporter.HasRuns()) // nothing ran when the benchmarks were only listed
    reporter.PrintSummary();
  benchmark::Shutdown();
  return 0;
}
