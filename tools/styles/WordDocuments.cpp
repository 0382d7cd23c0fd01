#include "WordDocuments.h"

#include "Input.h"
#include "Report.h"

#include <StylesWord/WordFile.h>
#include <StylesWord/WordSchema.h>

#include <StylesTools/Schema.h>

#include <Styles/StyleSheet.h>

#include <Json/Json.h>

#include <fstream>
#include <iostream>
#include <iterator>
#include <optional>
#include <sstream>

namespace StylesCommand {

using Styles::StyleSheet;
using Styles::Tools::Diagnostic;
using Styles::Tools::Severity;

namespace {

Styles::Tools::SchemaRegistration& Registration() {
  static Styles::Tools::SchemaRegistration registration;
  return registration;
}

bool ReadBytes(const std::string& path, std::string& bytes) {
  std::string reason;
  return StylesCommand::ReadBytes(path, bytes, reason);
}

std::string Where(const Styles::Word::Problem& problem) {
  std::string where = ToUtf8(problem.part);
  if (!problem.element.IsEmpty())
    where += (where.empty() ? "" : " ") + ToUtf8(problem.element);
  return where;
}

Diagnostic AsDiagnostic(const Styles::Word::Problem& problem, Severity severity) {
  Diagnostic diagnostic;
  diagnostic.severity = severity;
  diagnostic.code = severity == Severity::Error ? "word-error" : "word-warning";
  diagnostic.pointer = FromUtf8(Where(problem));
  diagnostic.message = problem.message;
  return diagnostic;
}

} // namespace

bool IsWordDocument(const std::string& path) {
  // A package starts with "PK", XML with "<" (after a byte order mark); a JSON
  // document with neither, and is left unread for the JSON reader.
  if (path != "-") {
    std::ifstream file(path, std::ios::binary);
    char start[3] = {};
    file.read(start, sizeof start);
    if (start[0] != 'P' && start[0] != '<' && start[0] != '\xEF')
      return false;
  }
  std::string bytes;
  return ReadBytes(path, bytes) && Styles::Word::IsWordFile(bytes);
}

bool AnyWordDocument(const std::vector<std::string>& paths) {
  for (const std::string& path : paths)
    if (!path.empty() && IsWordDocument(path))
      return true;
  return false;
}

bool RegisterWordSchema(int& status) {
  Styles::Tools::SchemaError error;
  if (!Styles::Tools::RegisterSchema(Styles::Word::WordSchema(), Registration(), error)) {
    Output::Error("", "the Word schema: " + ToUtf8(error.message));
    status = kUsage;
    return false;
  }
  return true;
}

void DeregisterWordSchema() { Styles::Tools::DeregisterSchema(Registration()); }

int LoadWordSheet(const std::string& path, StyleSheet& sheet, std::vector<Diagnostic>* warnings) {
  std::string bytes;
  if (!ReadBytes(path, bytes)) {
    Output::Error(DisplayName(path), "cannot be read");
    return kUnreadable;
  }
  Styles::Word::ReadReport report;
  if (!Styles::Word::ReadWord(bytes, sheet, report)) {
    Output::DocumentErrors(DisplayName(path), {AsDiagnostic(report.error, Severity::Error)});
    return kUnusable;
  }
  if (warnings)
    for (const Styles::Word::Problem& warning : report.warnings)
      warnings->push_back(AsDiagnostic(warning, Severity::Warning));
  return kSuccess;
}

bool WordDiagnostics(const std::string& path, std::vector<Diagnostic>& out) {
  std::string bytes;
  if (!ReadBytes(path, bytes))
    return false;
  StyleSheet sheet;
  Styles::Word::ReadReport report;
  if (!Styles::Word::ReadWord(bytes, sheet, report))
    out.push_back(AsDiagnostic(report.error, Severity::Error));
  for (const Styles::Word::Problem& warning : report.warnings)
    out.push_back(AsDiagnostic(warning, Severity::Warning));
  return true;
}

int Convert(const CommonOptions&, const std::string& input, const std::string& into,
            const std::string& output) {
  const bool word = IsWordDocument(input);
  StyleSheet sheet;
  std::vector<Diagnostic> warnings;
  if (const int status = LoadSheet(input, sheet, Loss::Ignore, &warnings))
    return status;
  if (!warnings.empty())
    Output::Warnings(DisplayName(input), warnings);
  std::string result;
  if (!into.empty()) {
    std::string package;
    if (!ReadBytes(into, package)) {
      Output::Error(DisplayName(into), "cannot be read");
      return kUnreadable;
    }
    Styles::Word::Problem problem;
    if (!Styles::Word::WriteIntoPackage(package, sheet, result, problem)) {
      Output::Error(DisplayName(into), Where(problem) + (Where(problem).empty() ? "" : ": ") +
                                           ToUtf8(problem.message));
      return kUnusable;
    }
  } else if (word) {
    Json::Value document{Json::Object()};
    sheet.ExportJson(document, true);
    result = ToUtf8(Json::ValueToString(document, true)) + "\n";
  } else {
    result = Styles::Word::WriteStylesPart(sheet);
  }
  return WriteOutput(result, output);
}

} // namespace StylesCommand
