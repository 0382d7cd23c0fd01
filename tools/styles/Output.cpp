#include "Output.h"

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <map>
#include <sstream>
#include <utility>

namespace StylesCommand {

using Styles::Style;
using Styles::StyleSheet;
using Styles::Tools::Diagnostic;
using Styles::Tools::Difference;
using Styles::Tools::Severity;
using Styles::Tools::ValueSource;

namespace {

// Trees deeper than this are drawn flush at this depth, with the depth
// written out, so that a long chain does not print a square of spaces.
constexpr std::size_t kMaxIndent = 24;

void Print(const Text& text) { std::cout << ToUtf8(text); }

void PrintJson(const Json::Value& value) {
  std::cout << ToUtf8(Json::ValueToString(value, true)) << '\n';
}

Json::Value TextOrNull(const Text& text, bool present) {
  return present ? Json::Value(text) : Json::Value();
}

Json::Value AsciiText(const std::string& text) { return Json::Value(FromUtf8(text)); }

const char* SeverityName(Severity severity) {
  return severity == Severity::Error ? "error" : "warning";
}

const char* SourceName(ValueSource source) {
  switch (source) {
  case ValueSource::Own:
    return "own";
  case ValueSource::Ancestor:
    return "ancestor";
  case ValueSource::Owner:
    return "owner";
  case ValueSource::Default:
    break;
  }
  return "default";
}

// "FILE:LINE:COLUMN: error: POINTER: message [code]", as compilers print.
std::string DiagnosticLine(const std::string& file, const Diagnostic& d) {
  std::string line = file;
  if (d.line > 0)
    line += ':' + std::to_string(d.line) + ':' + std::to_string(d.column);
  line += std::string(": ") + SeverityName(d.severity) + ": ";
  if (!d.pointer.IsEmpty())
    line += ToUtf8(d.pointer) + ": ";
  return line + ToUtf8(d.message) + " [" + d.code + "]";
}

Json::Value DiagnosticsJson(const std::vector<Diagnostic>& diagnostics) {
  Json::Array list;
  for (const Diagnostic& d : diagnostics) {
    Json::Object item;
    item.AddValue(u"severity", AsciiText(SeverityName(d.severity)));
    item.AddValue(u"code", AsciiText(d.code));
    item.AddValue(u"pointer", Json::Value(d.pointer));
    item.AddValue(u"message", Json::Value(d.message));
    if (d.line > 0) {
      item.AddValue(u"line", Json::Value(d.line));
      item.AddValue(u"column", Json::Value(d.column));
    }
    list.AddValue(Json::Value(std::move(item)));
  }
  return Json::Value(std::move(list));
}

// Where a style lives, for programs: the name of its outermost owner in the
// sheet and the path down to it ("cells[1].character"; empty for a style of
// the sheet itself). Null when it belongs to no style of the sheet.
Json::Value StyleLocation(const StyleSheet& sheet, const Style* style) {
  if (!style)
    return Json::Value();
  std::vector<std::string> steps;
  const Style* outermost = style;
  for (; outermost->GetOwner(); outermost = outermost->GetOwner()) {
    const Styles::PropertyKey& key = outermost->GetOwnerPropertyKey();
    std::string step = ToUtf8(key.GetString());
    const ZelUtils::Any* held = outermost->GetOwner()->GetProperties().Find(key);
    if (const auto* list = held ? held->GetIf<std::vector<Style*>>() : nullptr) {
      const auto found = std::find(list->begin(), list->end(), outermost);
      if (found != list->end())
        step += '[' + std::to_string(found - list->begin()) + ']';
    }
    steps.push_back(std::move(step));
  }
  const Text name = sheet.GetStyleName(outermost);
  if (name.IsEmpty())
    return Json::Value();
  std::string path;
  for (auto step = steps.rbegin(); step != steps.rend(); ++step)
    path += (path.empty() ? "" : ".") + *step;
  Json::Object location;
  location.AddValue(u"style", Json::Value(name));
  location.AddValue(u"path", Json::Value(FromUtf8(path)));
  return Json::Value(std::move(location));
}

// Where a value comes from, for people.
Text Explain(const StyleSheet& sheet, const Styles::Tools::Resolution& resolution) {
  switch (resolution.source) {
  case ValueSource::Own:
    return u"own";
  case ValueSource::Ancestor:
    return u"from " + Styles::Tools::DescribeStyle(sheet, resolution.holder);
  case ValueSource::Owner:
    return u"from " + Styles::Tools::DescribeStyle(sheet, resolution.holder) +
           u" (through the owner's parent)";
  case ValueSource::Default:
    break;
  }
  return u"default";
}

const char* KindName(Difference::Kind kind) {
  switch (kind) {
  case Difference::Kind::Added:
    return "added";
  case Difference::Kind::Removed:
    return "removed";
  case Difference::Kind::ParentChanged:
    return "parent";
  case Difference::Kind::ValueChanged:
    return "value";
  case Difference::Kind::EffectiveChanged:
    break;
  }
  return "effective";
}

std::string Padded(const std::string& text, std::size_t width) {
  return text.size() >= width ? text + " " : text + std::string(width - text.size(), ' ');
}

// The categories that have styles, ordered by key text.
std::map<Text, std::vector<Style*>> StylesByCategory(const StyleSheet& sheet) {
  StyleSheet::CategoryStyleMap categories;
  sheet.GenerateCategoryStyleMap(categories);
  std::map<Text, std::vector<Style*>> ordered;
  for (const auto& [key, styles] : categories)
    for (const auto& entry : styles)
      ordered[key.GetString()].push_back(entry.second);
  return ordered;
}

} // namespace

std::string ToUtf8(const Text& text) { return ZelPlatform::Utf16ToUtf8(text.GetView()); }

Text FromUtf8(const std::string& text) { return Text(ZelPlatform::Utf8ToUtf16(text)); }

// What the command prints to standard output, collected until Finish, and
// the first error, which --json prints instead.
struct Output::State {
  bool json = false;
  std::ostringstream collected;
  std::streambuf* standardOutput = nullptr;
  bool failed = false;
  Json::Object error;
};

Output::State& Output::Shared() {
  static State state;
  return state;
}

void Output::Begin(bool json) {
  State& state = Shared();
  state.json = json;
  state.standardOutput = std::cout.rdbuf(state.collected.rdbuf());
}

bool Output::Finish(int status) {
  State& state = Shared();
  if (state.standardOutput)
    std::cout.rdbuf(state.standardOutput);
  std::string bytes = state.collected.str();
  if (state.json && state.failed) {
    Json::Object error;
    error.AddValue(u"status", Json::Value(status));
    for (Json::Member& member : state.error)
      error.AddValue(member.name, std::move(member.value));
    Json::Object result;
    result.AddValue(u"error", Json::Value(std::move(error)));
    bytes = ToUtf8(Json::ValueToString(Json::Value(std::move(result)), true)) + "\n";
  }
  // Written and closed by hand: a full disk or a closed pipe must show.
  for (std::size_t written = 0; written < bytes.size();) {
    const ssize_t count = ::write(STDOUT_FILENO, bytes.data() + written, bytes.size() - written);
    if (count < 0 && errno == EINTR)
      continue;
    if (count <= 0) {
      std::cerr << "styles: cannot write standard output: " << std::strerror(errno) << '\n';
      return false;
    }
    written += static_cast<std::size_t>(count);
  }
  if (::close(STDOUT_FILENO) != 0 && errno != EBADF) {
    std::cerr << "styles: cannot write standard output: " << std::strerror(errno) << '\n';
    return false;
  }
  return true;
}

void Output::Error(const std::string& file, const std::string& message) {
  std::cerr << "styles: " << (file.empty() ? "" : file + ": ") << message << '\n';
  State& state = Shared();
  if (state.failed)
    return;
  state.failed = true;
  state.error.AddValue(u"file", TextOrNull(FromUtf8(file), !file.empty()));
  state.error.AddValue(u"message", Json::Value(FromUtf8(message)));
}

void Output::Error(const std::string& file, const Text& message) { Error(file, ToUtf8(message)); }

void Output::DocumentErrors(const std::string& file, const std::vector<Diagnostic>& diagnostics,
                            const std::string& conclusion) {
  std::vector<Diagnostic> errors;
  for (const Diagnostic& d : diagnostics)
    if (d.severity == Severity::Error) {
      std::cerr << "styles: " << DiagnosticLine(file, d) << '\n';
      errors.push_back(d);
    }
  const bool first = !Shared().failed;
  Error(file, conclusion);
  if (first)
    Shared().error.AddValue(u"diagnostics", DiagnosticsJson(errors));
}

void Output::Warnings(const std::string& file, const std::vector<Diagnostic>& diagnostics) {
  for (const Diagnostic& d : diagnostics)
    std::cerr << "styles: " << DiagnosticLine(file, d) << '\n';
}

void Output::Diagnostics(const std::vector<FileDiagnostics>& files) const {
  if (m_json) {
    Json::Array list;
    for (const FileDiagnostics& file : files) {
      Json::Value diagnostics = DiagnosticsJson(file.diagnostics);
      Json::Object entry;
      entry.AddValue(u"file", AsciiText(file.file));
      entry.AddValue(u"valid", Json::Value(!Styles::Tools::HasErrors(file.diagnostics)));
      entry.AddValue(u"diagnostics", Json::Value(std::move(diagnostics)));
      list.AddValue(Json::Value(std::move(entry)));
    }
    PrintJson(Json::Value(std::move(list)));
    return;
  }
  for (const FileDiagnostics& file : files) {
    std::size_t errors = 0;
    for (const Diagnostic& d : file.diagnostics) {
      errors += d.severity == Severity::Error ? 1 : 0;
      std::cout << DiagnosticLine(file.file, d) << '\n';
    }
    const std::size_t warnings = file.diagnostics.size() - errors;
    if (file.diagnostics.empty())
      std::cout << file.file << ": no problems\n";
    else
      std::cout << file.file << ": " << errors << (errors == 1 ? " error, " : " errors, ")
                << warnings << (warnings == 1 ? " warning\n" : " warnings\n");
  }
}

void Output::Tree(const StyleSheet& sheet) const {
  Json::Array categoriesJson;
  for (const auto& [key, styles] : StylesByCategory(sheet)) {
    // Roots are styles without a parent of their own category in the sheet.
    std::map<const Style*, std::vector<const Style*>> children;
    std::vector<const Style*> roots;
    for (const Style* style : styles) {
      const Style* parent = style->GetParent();
      if (parent && parent->GetCategoryName() == style->GetCategoryName() &&
          !sheet.GetStyleName(parent).IsEmpty())
        children[parent].push_back(style);
      else
        roots.push_back(style);
    }
    const Text uiName = styles.front()->GetCategoryUIName();
    Json::Array stylesJson;
    if (!m_json)
      std::cout << ToUtf8(key) << " (" << ToUtf8(uiName) << "), " << styles.size()
                << (styles.size() == 1 ? " style\n" : " styles\n");
    // Depth first without recursion: chains may be as long as the sheet.
    std::vector<std::pair<const Style*, std::size_t>> stack;
    for (auto it = roots.rbegin(); it != roots.rend(); ++it)
      stack.emplace_back(*it, 0);
    while (!stack.empty()) {
      const auto [style, depth] = stack.back();
      stack.pop_back();
      const Text name = sheet.GetStyleName(style);
      if (m_json) {
        Json::Object item;
        item.AddValue(u"name", Json::Value(name));
        const Text parent = sheet.GetStyleName(style->GetParent());
        item.AddValue(u"inherits", TextOrNull(parent, !parent.IsEmpty()));
        item.AddValue(u"depth", Json::Value(depth));
        stylesJson.AddValue(Json::Value(std::move(item)));
      } else {
        std::cout << std::string(2 * (std::min(depth, kMaxIndent) + 1), ' ');
        if (depth > kMaxIndent)
          std::cout << '(' << depth << ") ";
        std::cout << ToUtf8(name) << '\n';
      }
      const auto found = children.find(style);
      if (found != children.end())
        for (auto it = found->second.rbegin(); it != found->second.rend(); ++it)
          stack.emplace_back(*it, depth + 1);
    }
    if (m_json) {
      Json::Object category;
      category.AddValue(u"key", Json::Value(key));
      category.AddValue(u"name", Json::Value(uiName));
      category.AddValue(u"styles", Json::Value(std::move(stylesJson)));
      categoriesJson.AddValue(Json::Value(std::move(category)));
    }
  }
  if (m_json)
    PrintJson(Json::Value(std::move(categoriesJson)));
}

void Output::Values(const StyleSheet& sheet, const Style& style, bool explain) const {
  const std::vector<Styles::Tools::EffectiveValue> values =
      Styles::Tools::ListEffectiveValues(style);
  const Text name = Styles::Tools::DescribeStyle(sheet, &style);
  const Text parent = sheet.GetStyleName(style.GetParent());
  if (m_json) {
    Json::Array items;
    for (const Styles::Tools::EffectiveValue& value : values) {
      Json::Object item;
      item.AddValue(u"path", Json::Value(value.path));
      item.AddValue(u"value", Json::Value(Styles::Tools::FormatValue(*value.behaviour,
                                                                     *value.resolution.value)));
      item.AddValue(u"source", AsciiText(SourceName(value.resolution.source)));
      const bool inherited = value.resolution.source == ValueSource::Ancestor ||
                             value.resolution.source == ValueSource::Owner;
      item.AddValue(u"from", inherited ? StyleLocation(sheet, value.resolution.holder)
                                       : Json::Value());
      if (value.resolution.source == ValueSource::Owner)
        item.AddValue(u"through", StyleLocation(sheet, value.resolution.owner));
      items.AddValue(Json::Value(std::move(item)));
    }
    Json::Object result;
    result.AddValue(u"style", Json::Value(name));
    result.AddValue(u"category", Json::Value(style.GetCategoryName().GetString()));
    result.AddValue(u"inherits", TextOrNull(parent, !parent.IsEmpty()));
    result.AddValue(u"values", Json::Value(std::move(items)));
    PrintJson(Json::Value(std::move(result)));
    return;
  }
  std::cout << ToUtf8(name) << " (" << ToUtf8(style.GetCategoryUIName()) << ")";
  if (!parent.IsEmpty())
    std::cout << ", inherits " << ToUtf8(parent);
  std::cout << '\n';
  std::size_t pathWidth = 0, valueWidth = 0;
  std::vector<std::pair<std::string, std::string>> lines;
  for (const Styles::Tools::EffectiveValue& value : values) {
    lines.emplace_back(ToUtf8(value.path), ToUtf8(Styles::Tools::FormatValue(
                                               *value.behaviour, *value.resolution.value)));
    pathWidth = std::max(pathWidth, lines.back().first.size());
    valueWidth = std::max(valueWidth, lines.back().second.size());
  }
  pathWidth = std::min<std::size_t>(pathWidth + 2, 40);
  valueWidth = std::min<std::size_t>(valueWidth + 2, 40);
  for (std::size_t i = 0; i < values.size(); ++i) {
    std::cout << "  "
              << (explain ? Padded(lines[i].first, pathWidth)
                          : Padded(lines[i].first, pathWidth) + lines[i].second);
    if (explain)
      std::cout << Padded(lines[i].second, valueWidth)
                << ToUtf8(Explain(sheet, values[i].resolution));
    std::cout << '\n';
  }
}

void Output::Differences(const std::vector<Difference>& differences) const {
  if (m_json) {
    Json::Array items;
    for (const Difference& d : differences) {
      Json::Object item;
      item.AddValue(u"kind", AsciiText(KindName(d.kind)));
      item.AddValue(u"category", Json::Value(d.category.GetString()));
      item.AddValue(u"style", Json::Value(d.style));
      item.AddValue(u"path", Json::Value(d.path));
      item.AddValue(u"old", TextOrNull(d.oldValue, d.hasOld));
      item.AddValue(u"new", TextOrNull(d.newValue, d.hasNew));
      items.AddValue(Json::Value(std::move(item)));
    }
    PrintJson(Json::Value(std::move(items)));
    return;
  }
  for (const Difference& d : differences) {
    std::cout << ToUtf8(d.category.GetString()) << " \"" << ToUtf8(d.style) << "\": ";
    if (d.kind == Difference::Kind::Added || d.kind == Difference::Kind::Removed) {
      std::cout << KindName(d.kind) << '\n';
      continue;
    }
    if (d.kind == Difference::Kind::ParentChanged)
      std::cout << (d.path.IsEmpty() ? "" : ToUtf8(d.path) + " ") << "inherits";
    else
      std::cout << ToUtf8(d.path);
    if (d.kind == Difference::Kind::EffectiveChanged)
      std::cout << " (effective)";
    std::cout << ": " << (d.hasOld ? ToUtf8(d.oldValue) : "(unset)") << " -> "
              << (d.hasNew ? ToUtf8(d.newValue) : "(unset)") << '\n';
  }
}

void Output::Document(const Text& json) const { Print(json + u"\n"); }

void Output::Names(const std::vector<Text>& names) const {
  if (m_json) {
    Json::Array list;
    for (const Text& name : names)
      list.AddValue(Json::Value(name));
    PrintJson(Json::Value(std::move(list)));
    return;
  }
  for (const Text& name : names)
    Print(name + u"\n");
}

void Output::Message(const std::string& text) const {
  if (m_json) {
    Json::Object result;
    result.AddValue(u"message", AsciiText(text));
    PrintJson(Json::Value(std::move(result)));
    return;
  }
  std::cout << text << '\n';
}

} // namespace StylesCommand
