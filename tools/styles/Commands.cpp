#include "Commands.h"

#include "WordDocuments.h"

#include "Graph.h"
#include "Input.h"
#include "Report.h"

#include <StylesTools/Diff.h>
#include <StylesTools/Schema.h>

#include <Styles/FolderPresetManager.h>
#include <Styles/StyleSheet.h>

#include <StylesTools/Rewrite.h>

#include <Json/Json.h>
#include <SystemIO/AtomicFile.h>
#include <SystemIO/FileSystem.h>
#include <SystemIO/Path.h>
#include <ZelUtils/Stream.h>
#include <ZelUtils/TextStream.h>

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <iostream>
#include <iterator>
#include <memory>
#include <optional>
#include <string_view>
#include <system_error>
#include <utility>

namespace StylesCommand {

using Styles::Style;
using Styles::StyleSheet;
using Styles::Tools::Diagnostic;
using Styles::Tools::Severity;

std::string DisplayName(const std::string& path) { return path == "-" ? "<stdin>" : path; }

namespace {

Styles::Tools::SchemaRegistration& Registration() {
  static Styles::Tools::SchemaRegistration registration;
  return registration;
}

// A document's file name without its folder, to title a page or graph.
std::string TitleOf(const std::string& path) {
  return std::filesystem::path(DisplayName(path)).filename().string();
}

// Whether the file `path` is the one standard output writes to, as with
// "styles format a.json > a.json".
bool IsStandardOutput(const std::string& path) {
  struct stat file, output;
  return path != "-" && ::stat(path.c_str(), &file) == 0 && ::fstat(STDOUT_FILENO, &output) == 0 &&
         S_ISREG(output.st_mode) && file.st_dev == output.st_dev && file.st_ino == output.st_ino;
}

// Reads a document's text; `diagnostics` gets an error for bytes that are not
// UTF-8 (they are read as U+FFFD). With `digest`, a hash of the bytes goes
// there, for a caller that lets the text go and may read it again.
int ReadDocument(const std::string& path, Text& text, std::vector<Diagnostic>& diagnostics,
                 std::size_t* digest = nullptr) {
  std::string bytes, reason;
  if (!ReadBytes(path, bytes, reason)) {
    Output::Error(DisplayName(path), "cannot be read: " + reason);
    return kUnreadable;
  }
  if (std::optional<Diagnostic> invalid = FindInvalidUtf8(bytes))
    diagnostics.push_back(std::move(*invalid));
  if (digest)
    *digest = std::hash<std::string_view>()(bytes);
  text = DecodeUtf8(std::move(bytes));
  return kSuccess;
}

// Whether LocateDiagnostics has a diagnostic to place.
bool NeedsPositions(const std::vector<Diagnostic>& diagnostics) {
  return std::any_of(diagnostics.begin(), diagnostics.end(),
                     [](const Diagnostic& d) { return d.line == 0 && !d.pointer.IsEmpty(); });
}

// Whether a command goes on after reading a document into a sheet, given the
// diagnostics of the reading. Text that is not UTF-8 stops every command; what
// a rewrite would lose stops a rewriting one, unless the loss is accepted.
int Conclude(const std::string& path, std::vector<Diagnostic> diagnostics, bool imported,
             Loss loss) {
  const auto isEncoding = [](const Diagnostic& d) { return d.code == "invalid-utf8"; };
  const bool badEncoding = std::any_of(diagnostics.begin(), diagnostics.end(), isEncoding);
  if (!imported || (badEncoding && loss != Loss::Accept)) {
    Output::DocumentErrors(DisplayName(path), diagnostics);
    return kUnusable;
  }
  std::vector<Diagnostic> losses;
  for (Diagnostic& d : diagnostics)
    if (isEncoding(d) || Styles::Tools::LosesContent(d))
      losses.push_back(d);
  if (losses.empty() || loss == Loss::Ignore)
    return kSuccess;
  if (loss == Loss::Accept) {
    for (Diagnostic& d : losses)
      d.severity = Severity::Warning;
    Output::Warnings(DisplayName(path), losses);
    return kSuccess;
  }
  for (Diagnostic& d : losses)
    d.severity = Severity::Error;
  Output::DocumentErrors(DisplayName(path), losses,
                         "writing the document again would lose or change what is listed; "
                         "--lossy accepts that");
  return kUnusable;
}

} // namespace

namespace {

// Reads the JSON document `path` into `sheet` all or nothing; with `style`,
// only what that style depends on, so that a large document answers for one
// style at the cost of that style alone. The text is read in compact parses
// (no value tree); for a style, the part it depends on is written out as a
// text of its own. Each text is let go once read; the file is read again
// only to place diagnostics, and only when it is unchanged.
int LoadJson(const std::string& path, StyleSheet& sheet, Loss loss, const std::string* style) {
  Text text;
  std::size_t digest = 0;
  std::vector<Diagnostic> diagnostics;
  if (const int status = ReadDocument(path, text, diagnostics, &digest))
    return status;
  std::vector<Diagnostic> found;
  if (style) {
    Text part;
    {
      Json::Document document;
      Text parseError;
      if (!document.ParseBorrowed(text, parseError) || !document.GetRoot().IsObject()) {
        // The full check says where the text goes wrong.
        found = Styles::Tools::ValidateDocument(text);
        diagnostics.insert(diagnostics.end(), found.begin(), found.end());
        return Conclude(path, std::move(diagnostics), false, loss);
      }
      part = Styles::Tools::SelectStylesText(document, {FromUtf8(*style)});
    }
    std::swap(text, part); // the document's text goes with `part`
  }
  const bool imported = Styles::Tools::ImportChecked(sheet, std::move(text), true, &found);
  std::string bytes, reason;
  if (NeedsPositions(found) && ReadBytes(path, bytes, reason) &&
      std::hash<std::string_view>()(bytes) == digest)
    Styles::Tools::LocateDiagnostics(DecodeUtf8(std::move(bytes)), found);
  diagnostics.insert(diagnostics.end(), found.begin(), found.end());
  return Conclude(path, std::move(diagnostics), imported, loss);
}

// LoadSheet for the style `name` and what it depends on.
int LoadStyle(const std::string& path, const std::string& name, StyleSheet& sheet,
              Loss loss = Loss::Ignore) {
  return IsWordDocument(path) ? LoadWordSheet(path, sheet, nullptr)
                              : LoadJson(path, sheet, loss, &name);
}

} // namespace

int LoadSheet(const std::string& path, StyleSheet& sheet, Loss loss,
              std::vector<Diagnostic>* warnings) {
  return IsWordDocument(path) ? LoadWordSheet(path, sheet, warnings)
                              : LoadJson(path, sheet, loss, nullptr);
}

namespace {

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
    std::string bytes, reason;
    if (!ReadBytes(path, bytes, reason)) {
      Output::Error(DisplayName(path), "cannot be read: " + reason);
      status = kUnreadable;
      return false;
    }
    const Text text = DecodeUtf8(std::move(bytes));
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
    std::vector<Diagnostic> diagnostics;
    if (ReadDocument(document, text, diagnostics) != kSuccess) {
      unreadable = true;
      continue;
    }
    const std::vector<Diagnostic> found = Styles::Tools::ValidateDocument(text);
    diagnostics.insert(diagnostics.end(), found.begin(), found.end());
    files.push_back(FileDiagnostics{DisplayName(document), std::move(diagnostics)});
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

int Flatten(const CommonOptions&, const std::string& document, const std::string& name,
            bool lossy) {
  StyleSheet sheet;
  if (const int status = LoadStyle(document, name, sheet, lossy ? Loss::Accept : Loss::Refuse))
    return status;
  const Style* style = FindStyle(sheet, document, name);
  if (!style)
    return kNegative;
  const std::unique_ptr<Style> flattened(style->CreateFlattenedStyle());
  Json::Value value;
  Styles::Tools::SerializeComplete(sheet, *flattened, value);
  Output(true).Document(Json::ValueToString(value, true));
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

int Format(const CommonOptions&, const std::string& document, const FormatOptions& format) {
  StyleSheet sheet;
  if (format.output.empty() && !format.inPlace && IsStandardOutput(document)) {
    Output::Error(document, "is also standard output, which was emptied before it could be "
                            "read; --in-place rewrites a document");
    return kUsage;
  }
  if (const int status = LoadSheet(document, sheet, format.lossy ? Loss::Accept : Loss::Refuse))
    return status;
  Json::Value value;
  Styles::Tools::ExportComplete(sheet, value);
  const Text text = Json::ValueToString(value, !format.compact);
  const std::string target = format.inPlace ? document : format.output;
  if (target.empty()) {
    Output(true).Document(text);
    return kSuccess;
  }
  // A temporary file renamed over the target: the target holds the old
  // document or the new one, never a part.
  std::string error;
  if (!SystemIO::WriteFileAtomically(target, ToUtf8(text) + "\n", &error)) {
    Output::Error(target, "cannot be written: " + error);
    return kUnreadable;
  }
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
