// Everything the styles command prints, as text for people or, with --json,
// as JSON for programs. Commands hand over results; only this unit decides
// how they look. Results go to standard output, problems to standard error.
#pragma once

#include <StylesTools/Diagnostics.h>
#include <StylesTools/Diff.h>
#include <StylesTools/Provenance.h>

#include <ZelPlatform/ZelString.h>

#include <string>
#include <vector>

namespace Styles {
class Style;
class StyleSheet;
} // namespace Styles

namespace StylesCommand {

using Text = ZelStringT<char16_t>;

// The diagnostics of one file.
struct FileDiagnostics {
  std::string file;
  std::vector<Styles::Tools::Diagnostic> diagnostics;
};

class Output {
public:
  explicit Output(bool json) : m_json(json) {}

  // Collects standard output from here on, so that a command that fails
  // prints its error alone, and a failing write is noticed.
  static void Begin(bool json);
  // Writes what was collected to standard output, or with --json after an
  // error only the error object ({"error": {...}} with `status`), and closes
  // it. False, with the reason on standard error, when a write fails.
  static bool Finish(int status);

  // A problem that stops a command, on standard error: "styles: FILE: message";
  // with --json, the first one is also the error object.
  static void Error(const std::string& file, const std::string& message);
  static void Error(const std::string& file, const Text& message);
  // The errors among `diagnostics` of a document, with line and column,
  // followed by `conclusion`; they make up the error.
  static void DocumentErrors(
      const std::string& file, const std::vector<Styles::Tools::Diagnostic>& diagnostics,
      const std::string& conclusion = "the document has errors; \"styles validate\" lists them all");
  // Warnings about a document, on standard error; not an error.
  static void Warnings(const std::string& file,
                       const std::vector<Styles::Tools::Diagnostic>& diagnostics);

  void Diagnostics(const std::vector<FileDiagnostics>& files) const;
  // Each category's styles as inheritance trees.
  void Tree(const Styles::StyleSheet& sheet) const;
  // A style's effective values; with `explain`, where each comes from.
  void Values(const Styles::StyleSheet& sheet, const Styles::Style& style, bool explain) const;
  void Differences(const std::vector<Styles::Tools::Difference>& differences) const;
  // A JSON document (already JSON, whatever --json says).
  void Document(const Text& json) const;
  void Names(const std::vector<Text>& names) const;
  void Message(const std::string& text) const;

private:
  struct State;
  static State& Shared();

  bool m_json;
};

// UTF-16 text as UTF-8 for the terminal and files, and back.
std::string ToUtf8(const Text& text);
Text FromUtf8(const std::string& text);

} // namespace StylesCommand
