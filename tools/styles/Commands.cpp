#include "Commands.h"

#include "Graph.h"
#include "Report.h"
#include "WordDocuments.h"

#include <StylesTools/Diff.h>
#include <StylesTools/Schema.h>

#include <Styles/FolderPresetManager.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <SystemIO/FileSystem.h>
#include <SystemIO/Path.h>
#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <filesystem>
#include <iostream>
#include <iterator>
#include <memory>
#include <system_error>

namespace StylesCommand {

using Styles::Style;
using Styles::StyleSheet;
using Styles::Tools::Diagnostic;

namespace {

Styles::Tools::SchemaRegistration& Registration() {
  static Styles::Tools::SchemaRegistration registration;
  return registration;
}

std::string DisplayName(const std::string& path) { return path == "-" ? "<stdin>" : path; }

// A document's file name without its folder, to title a page or graph.
std::string TitleOf(const std::string& path) {
  return std::filesystem::path(DisplayName(path)).filename().string();
}

// The whole of a file, or of standard input for "-", decoded from UTF-8.
bool ReadText(const std::string& path, Text& text) {
  ZelUtils::Stream stream;
  if (path == "-") {
    std::string bytes{std::istreambuf_iterator<char>(std::cin), std::istreambuf_iterator<char>()};
    stream = ZelUtils::MemoryStream::FromBytes(std::move(bytes));
  } else {
    stream = ZelUtils::FileStream::Open(FromUtf8(path));
    if (!stream)
      return false;
  }
  text = ZelUtils::TextStreamReader(stream, ZelUtils::TextStream::UTF8).ReadToEnd();
  return true;
}

} // namespace

int LoadSheet(const std::string& path, StyleSheet& sheet, std::vector<Diagnostic>* warnings) {
  if (IsWordDocument(path))
    return LoadWordSheet(path, sheet, warnings);
  Text text;
  if (!ReadText(path, text)) {
    Output::Error(DisplayName(path), "cannot be read");
    return kUnreadable;
  }
  std::vector<Diagnostic> diagnostics;
  if (!Styles::Tools::ImportChecked(sheet, text, true, &diagnostics)) {
    Output::DocumentErrors(DisplayName(path), diagnostics);
    return kUnusable;
  }
  if (warnings)
    *warnings = std::move(diagnostics);
  return kSuccess;
}

namespace {

// Reads from `path` only what the style `name` depends on, all or nothing:
// a large document answers for one style at the cost of that style alone.
int LoadStyle(const std::string& path, const std::string& name, StyleSheet& sheet) {
  if (IsWordDocument(path))
    return LoadWordSheet(path, sheet, nullptr);
  Text text;
  if (!ReadText(path, text)) {
    Output::Error(DisplayName(path), "cannot be read");
    return kUnreadable;
  }
  Json::Value value;
  Text parseError;
  if (!Json::Parse(text, value, parseError) || !value.Is<Json::Object>()) {
    // The full check says where the text goes wrong.
    Output::DocumentErrors(DisplayName(path), Styles::Tools::ValidateDocument(text));
    return kUnusable;
  }
  Json::Object part = Styles::Tools::SelectStyles(value.Get<Json::Object>(), {FromUtf8(name)});
  std::vector<Diagnostic> diagnostics;
  if (!Styles::Tools::ImportChecked(sheet, part, true, &diagnostics)) {
    Output::DocumentErrors(DisplayName(path), diagnostics);
    return kUnusable;
  }
  return kSuccess;
}

const Style* FindStyle(const StyleSheet& sheet, const std::string& document,
                       const std::string& name) {
  const Style* style = sheet.GetStyle(FromUtf8(name));
  if (!style)
    Output::Error(DisplayName(document), "no style is called \"" + name + "\"");
  return style;
}

// Checks the folder and the set name of a preset command; `set` may be empty
// only where the command takes no set.
int CheckPresetArguments(const std::string& folder, const std::string& set, bool setRequired) {
  std::error_code error;
  if (!std::filesystem::is_directory(folder, error)) {
    if (!error && std::filesystem::exists(folder, error))
      error = std::make_error_code(std::errc::not_a_directory);
    Output::Error(folder, "is not a folder: " + error.message());
    return kUnreadable;
  }
  if ((setRequired || !set.empty()) && !Styles::StylePresetManager::IsValidSetName(FromUtf8(set))) {
    Output::Error(set, set.empty() ? "a preset set needs a name" : "cannot name a preset set");
    return kUsage;
  }
  return kSuccess;
}

// The line that tells how to get past a set file that does not load.
void SuggestRecovery(const std::string& folder, const std::string& set) {
  Output::Error("", "\"styles preset recover --folder " + folder + " " + set +
                        "\" moves the file aside and starts the set afresh");
}

// CheckPresetArguments, then the set's file: the preset manager loads sets
// with a plain import, so a damaged or unreadable file is caught here and
// reported instead of half read or taken for a missing set.
int CheckPresetSet(const std::string& folder, const std::string& set) {
  if (const int status = CheckPresetArguments(folder, set, true))
    return status;
  const Text path = SystemIO::Path::Combine(FromUtf8(folder), FromUtf8(set + ".qsty"));
  std::string bytes, reason;
  if (!SystemIO::File::ReadRegular(path, Styles::FolderPresetManager::kMaxSetFileBytes, bytes,
                                   &reason)) {
    if (!SystemIO::File::Exists(path))
      return kSuccess; // no set yet
    Output::Error(ToUtf8(path), "cannot be read: " + reason);
    SuggestRecovery(folder, set);
    return kUnreadable;
  }
  const Text text = ZelUtils::TextStreamReader(ZelUtils::MemoryStream::FromBytes(std::move(bytes)),
                                               ZelUtils::TextStream::UTF8)
                        .ReadToEnd();
  if (Text(text).Trim().IsEmpty())
    return kSuccess; // saved without a sheet
  const std::vector<Diagnostic> diagnostics = Styles::Tools::ValidateDocument(text);
  if (Styles::Tools::HasErrors(diagnostics)) {
    Output::DocumentErrors(ToUtf8(path), diagnostics);
    SuggestRecovery(folder, set);
    return kUnusable;
  }
  return kSuccess;
}

// Saves the set after an edit: the manager's own save may have counted a
// file it could not make as success.
int SavePresetSet(Styles::FolderPresetManager& presets, const std::string& folder,
                  const std::string& set) {
  if (presets.Save(FromUtf8(set)) && !presets.LastSaveFailed())
    return kSuccess;
  Output::Error(folder,
                "cannot save the preset set \"" + set + "\": " + presets.GetLastSaveError());
  return kUnreadable;
}

} // namespace

bool RegisterSchemaFile(const std::string& path, int& status) {
  Styles::Tools::Schema schema;
  if (path.empty()) {
    schema = Styles::Tools::DefaultSchema();
  } else {
    Text text;
    if (!ReadText(path, text)) {
      Output::Error(DisplayName(path), "cannot be read");
      status = kUnreadable;
      return false;
    }
    Styles::Tools::SchemaError error;
    if (!Styles::Tools::ParseSchema(text, schema, error)) {
      Output::Error(
          DisplayName(path),
          "not a schema: " + (error.pointer.IsEmpty() ? "" : ToUtf8(error.pointer) + ": ") +
              ToUtf8(error.message));
      status = kUsage;
      return false;
    }
  }
  Styles::Tools::SchemaError error;
  if (!Styles::Tools::RegisterSchema(schema, Registration(), error)) {
    Output::Error(DisplayName(path), ToUtf8(error.pointer) + ": " + ToUtf8(error.message));
    status = kUsage;
    return false;
  }
  return true;
}

void DeregisterSchemaFile() { Styles::Tools::DeregisterSchema(Registration()); }

int Validate(const CommonOptions& options, const std::vector<std::string>& documents) {
  std::vector<FileDiagnostics> files;
  bool unreadable = false;
  for (const std::string& document : documents) {
    std::vector<Diagnostic> word;
    if (IsWordDocument(document) && WordDiagnostics(document, word)) {
      files.push_back(FileDiagnostics{DisplayName(document), std::move(word)});
      continue;
    }
    Text text;
    if (!ReadText(document, text)) {
      Output::Error(DisplayName(document), "cannot be read");
      unreadable = true;
      continue;
    }
    files.push_back(FileDiagnostics{DisplayName(document), Styles::Tools::ValidateDocument(text)});
  }
  Output(options.json).Diagnostics(files);
  if (unreadable)
    return kUnreadable;
  for (const FileDiagnostics& file : files)
    if (Styles::Tools::HasErrors(file.diagnostics))
      return kNegative;
  return kSuccess;
}

int List(const CommonOptions& options, const std::string& document) {
  StyleSheet sheet;
  if (const int status = LoadSheet(document, sheet))
    return status;
  Output(options.json).Tree(sheet);
  return kSuccess;
}

int Show(const CommonOptions& options, const std::string& document, const std::string& name,
         bool explain) {
  StyleSheet sheet;
  if (const int status = LoadStyle(document, name, sheet))
    return status;
  const Style* style = FindStyle(sheet, document, name);
  if (!style)
    return kNegative;
  Output(options.json).Values(sheet, *style, explain);
  return kSuccess;
}

int Flatten(const CommonOptions&, const std::string& document, const std::string& name) {
  StyleSheet sheet;
  if (const int status = LoadStyle(document, name, sheet))
    return status;
  const Style* style = FindStyle(sheet, document, name);
  if (!style)
    return kNegative;
  const std::unique_ptr<Style> flattened(style->CreateFlattenedStyle());
  Output(true).Document(flattened->Serialize(sheet, true, true));
  return kSuccess;
}

int Diff(const CommonOptions& options, const std::string& oldDocument,
         const std::string& newDocument, bool effective) {
  StyleSheet oldSheet, newSheet;
  if (const int status = LoadSheet(oldDocument, oldSheet))
    return status;
  if (const int status = LoadSheet(newDocument, newSheet))
    return status;
  const std::vector<Styles::Tools::Difference> differences =
      Styles::Tools::DiffSheets(oldSheet, newSheet, effective);
  Output(options.json).Differences(differences);
  return differences.empty() ? kSuccess : kNegative;
}

int Format(const CommonOptions&, const std::string& document, bool compact) {
  StyleSheet sheet;
  std::vector<Diagnostic> warnings;
  if (const int status = LoadSheet(document, sheet, &warnings))
    return status;
  // What the sheet did not take is left out of the rewritten document.
  for (const Diagnostic& warning : warnings)
    Output::Error(DisplayName(document), "warning: " + ToUtf8(warning.pointer) + ": " +
                                             ToUtf8(warning.message) + " [" + warning.code + "]");
  Json::Value value{Json::Object()};
  sheet.ExportJson(value, true);
  Output(true).Document(Json::ValueToString(value, !compact));
  return kSuccess;
}

int Report(const CommonOptions&, const std::string& document, const std::string& output,
           const std::string& against) {
  StyleSheet sheet, oldSheet;
  if (const int status = LoadSheet(document, sheet))
    return status;
  if (!against.empty())
    if (const int status = LoadSheet(against, oldSheet))
      return status;
  return WriteOutput(BuildReport(sheet, TitleOf(document), against.empty() ? nullptr : &oldSheet,
                                 TitleOf(against)),
                     output);
}

int Graph(const CommonOptions&, const std::string& document) {
  StyleSheet sheet;
  if (const int status = LoadSheet(document, sheet))
    return status;
  WriteDot(sheet, TitleOf(document), std::cout);
  return kSuccess;
}

int PresetList(const CommonOptions& options, const std::string& folder, const std::string& set) {
  if (const int status = CheckPresetArguments(folder, set, false))
    return status;
  Styles::FolderPresetManager presets(FromUtf8(folder));
  if (set.empty()) {
    Output(options.json).Names(presets.GetPresetSetNames());
    return kSuccess;
  }
  if (const int status = CheckPresetSet(folder, set))
    return status;
  if (!presets.GetPresetStyleSheet(FromUtf8(set))) {
    Output::Error(folder, "no preset set \"" + set + "\"");
    return kNegative;
  }
  Output(options.json).Names(presets.GetPresetNames(FromUtf8(set)));
  return kSuccess;
}

int PresetShow(const CommonOptions& options, const std::string& folder, const std::string& set,
               const std::string& name) {
  if (const int status = CheckPresetSet(folder, set))
    return status;
  Styles::FolderPresetManager presets(FromUtf8(folder));
  const StyleSheet* sheet = presets.GetPresetStyleSheet(FromUtf8(set));
  const Style* preset = sheet ? presets.GetPreset(FromUtf8(set), FromUtf8(name)) : nullptr;
  if (!preset) {
    Output::Error(folder, "no preset \"" + name + "\" in set \"" + set + "\"");
    return kNegative;
  }
  Output(options.json).Values(*sheet, *preset, true);
  return kSuccess;
}

int PresetAdd(const CommonOptions& options, const std::string& folder, const std::string& set,
              const std::string& document, const std::string& styleName, const std::string& name,
              bool replace) {
  if (const int status = CheckPresetSet(folder, set))
    return status;
  StyleSheet sheet;
  if (const int status = LoadSheet(document, sheet))
    return status;
  const Style* style = FindStyle(sheet, document, styleName);
  if (!style)
    return kNegative;
  const Text setName = FromUtf8(set);
  const Text presetName = FromUtf8(name.empty() ? styleName : name);
  Styles::FolderPresetManager presets(FromUtf8(folder));
  if (!presets.GetPresetStyleSheet(setName) && !presets.CreatePresetSet(setName)) {
    const std::string& reason = presets.GetLastSaveError();
    Output::Error(folder, "cannot create the preset set \"" + set + "\"" +
                              (reason.empty() ? std::string() : ": " + reason));
    return kUnreadable;
  }
  if (!replace && presets.DoesPresetNameExist(setName, presetName)) {
    Output::Error(folder, "set \"" + set + "\" already has a preset \"" + ToUtf8(presetName) +
                              "\"; --replace replaces it");
    return kNegative;
  }
  presets.AddPreset(setName, presetName, style, replace);
  if (const int status = SavePresetSet(presets, folder, set))
    return status;
  Output(options.json)
      .Message("added preset \"" + ToUtf8(presetName) + "\" to set \"" + set + "\"");
  return kSuccess;
}

int PresetDelete(const CommonOptions& options, const std::string& folder, const std::string& set,
                 const std::string& name) {
  if (const int status = CheckPresetSet(folder, set))
    return status;
  Styles::FolderPresetManager presets(FromUtf8(folder));
  if (!presets.DoesPresetNameExist(FromUtf8(set), FromUtf8(name))) {
    Output::Error(folder, "no preset \"" + name + "\" in set \"" + set + "\"");
    return kNegative;
  }
  presets.DeletePreset(FromUtf8(set), FromUtf8(name));
  if (const int status = SavePresetSet(presets, folder, set))
    return status;
  Output(options.json).Message("deleted preset \"" + name + "\" from set \"" + set + "\"");
  return kSuccess;
}

int PresetRecover(const CommonOptions& options, const std::string& folder, const std::string& set) {
  if (const int status = CheckPresetArguments(folder, set, true))
    return status;
  Styles::FolderPresetManager presets(FromUtf8(folder));
  const Text setName = FromUtf8(set);
  if (presets.GetPresetStyleSheet(setName)) {
    Output::Error(folder, "the preset set \"" + set + "\" loads; nothing to recover");
    return kNegative;
  }
  const Text path = SystemIO::Path::Combine(FromUtf8(folder), presets.GetFileName(setName));
  Text movedTo;
  if (!presets.SetAsideDamagedSet(setName, &movedTo)) {
    if (!SystemIO::File::Exists(path)) {
      Output::Error(folder, "no preset set \"" + set + "\"");
      return kNegative;
    }
    Output::Error(ToUtf8(path), "cannot be moved aside");
    return kUnreadable;
  }
  if (!presets.CreatePresetSet(setName)) {
    Output::Error(folder, "moved the damaged set file to " + ToUtf8(movedTo) +
                              ", but cannot start the set afresh: " + presets.GetLastSaveError());
    return kUnreadable;
  }
  Output(options.json)
      .Message("moved the damaged set file to " + ToUtf8(movedTo) + "; the preset set \"" + set +
               "\" starts afresh");
  return kSuccess;
}

} // namespace StylesCommand
