// styles: asks what is in a style sheet document, whether it is sound, where
// a style's effective values come from and what changed between two
// versions, rewrites documents and manages preset files. Commands take files
// or "-" for standard input; see Commands.h for the exit statuses.
#include "Commands.h"
#include "WordDocuments.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <exception>
#include <iostream>
#include <string>
#include <vector>

namespace {

using namespace StylesCommand;

// --schema and --json, taken before the command or after it.
void AddCommonOptions(CLI::App& command, CommonOptions& options) {
  command.add_option("--schema", options.schema,
                     "JSON schema of the categories (default: the built-in word-processor schema)");
  command.add_flag("--json", options.json, "Machine-readable output, errors included");
}

constexpr const char* kFooter =
    "Exit status: 0 success, 1 errors found, differences or nothing of that name,\n"
    "2 bad usage or schema, 3 a file that cannot be read or written, 4 a document\n"
    "with errors, or one that a rewrite would not keep whole.";

// The number of single-character edits that turn `a` into `b`.
std::size_t EditDistance(const std::string& a, const std::string& b) {
  std::vector<std::size_t> row(b.size() + 1);
  for (std::size_t j = 0; j <= b.size(); ++j)
    row[j] = j;
  for (std::size_t i = 1; i <= a.size(); ++i) {
    std::size_t diagonal = row[0];
    row[0] = i;
    for (std::size_t j = 1; j <= b.size(); ++j) {
      const std::size_t above = row[j];
      row[j] = std::min({row[j] + 1, row[j - 1] + 1, diagonal + (a[i - 1] == b[j - 1] ? 0 : 1)});
      diagonal = above;
    }
  }
  return row[b.size()];
}

// The command words in `arguments` (options of the program itself and their
// values skipped) that name no command of `app`, with the nearest known
// name; empty when every command word is known.
std::string UnknownCommand(const CLI::App& app, const std::vector<std::string>& arguments) {
  const CLI::App* level = &app;
  for (std::size_t i = 0; i < arguments.size(); ++i) {
    const std::string& word = arguments[i];
    if (word == "--")
      return "";
    if (!word.empty() && word[0] == '-') {
      i += word == "--schema" ? 1 : 0; // the option's value
      continue;
    }
    const std::vector<const CLI::App*> commands = level->get_subcommands({});
    if (commands.empty())
      return "";
    const CLI::App* found = nullptr;
    std::string nearest;
    std::size_t best = word.size();
    for (const CLI::App* command : commands) {
      if (command->get_name() == word)
        found = command;
      const std::size_t distance = EditDistance(word, command->get_name());
      if (distance < best) {
        best = distance;
        nearest = command->get_name();
      }
    }
    if (found) {
      level = found;
      if (found->get_subcommands({}).empty())
        return ""; // the rest are the command's own arguments
      continue;
    }
    std::string message = "unknown command \"" + word + "\"";
    if (!nearest.empty() && best <= std::max<std::size_t>(2, word.size() / 3))
      message += " (did you mean \"" + nearest + "\"?)";
    return message;
  }
  return "";
}

} // namespace

int main(int argc, char** argv) {
  const std::vector<std::string> arguments(argv + 1, argv + argc);
  CommonOptions options;
  Output::Begin(std::find(arguments.begin(), arguments.end(), "--json") != arguments.end());

  CLI::App app{"Inspect, check, compare and rewrite style sheet documents.", "styles"};
  app.footer(kFooter);
  app.require_subcommand(1);
  app.set_version_flag("--version", std::string("styles ") + STYLES_VERSION);
  AddCommonOptions(app, options);

  std::vector<std::string> documents;
  std::string document, otherDocument, style, folder, set, name, outputFile;
  bool explain = false, effective = false, replace = false, lossy = false;
  FormatOptions formatOptions;

  CLI::App* validate = app.add_subcommand("validate", "List every problem of documents");
  validate->add_option("documents", documents, "Documents, or - for standard input")->required();
  CLI::App* list = app.add_subcommand("list", "Show each category's styles as inheritance trees");
  list->add_option("document", document, "Document, or -")->required();
  CLI::App* show = app.add_subcommand("show", "Print a style's effective values");
  show->add_option("document", document, "Document, or -")->required();
  show->add_option("style", style, "Style name (letter case ignored)")->required();
  show->add_flag("--explain", explain, "Tell where each value comes from");
  CLI::App* flatten = app.add_subcommand("flatten", "Print the flattened style as JSON");
  flatten->add_option("document", document, "Document, or -")->required();
  flatten->add_option("style", style, "Style name (letter case ignored)")->required();
  flatten->add_flag("--lossy", lossy, "Go on when reading the document loses part of it");
  CLI::App* diff = app.add_subcommand("diff", "Print the differences between two documents");
  diff->add_option("old", document, "Old document, or -")->required();
  diff->add_option("new", otherDocument, "New document, or -")->required();
  diff->add_flag("--effective", effective, "Also list effective values that changed");
  CLI::App* format = app.add_subcommand("format", "Rewrite a document in canonical form");
  format->add_option("document", document, "Document, or -")->required();
  format->add_flag("--compact", formatOptions.compact, "One line instead of indented text");
  format->add_flag("--lossy", formatOptions.lossy,
                   "Rewrite even what reading the document loses or changes");
  CLI::Option* output =
      format->add_option("-o,--output", formatOptions.output, "Write to FILE, replacing it whole");
  format->add_flag("--in-place", formatOptions.inPlace, "Replace the document's file whole")
      ->excludes(output);

  CLI::App* report =
      app.add_subcommand("report", "Write an HTML page of the inheritance graphs and values");
  report->add_option("document", document, "Document, or -")->required();
  report->add_option("-o,--output", outputFile, "HTML file to write (default: standard output)");
  report->add_option("--against", otherDocument, "Older document whose differences are marked");
  CLI::App* graph = app.add_subcommand("graph", "Print the inheritance graph as Graphviz DOT");
  graph->add_option("document", document, "Document, or -")->required();
  std::string into;
  CLI::App* convert = app.add_subcommand(
      "convert", "Convert between a JSON document and a Word file (a Word file gives JSON)");
  convert->add_option("input", document, "Document or Word file, or -")->required();
  convert->add_option("--into", into, "Write the styles into a copy of this Word package");
  convert->add_option("-o,--output", outputFile, "Output file (default: standard output)");

  CLI::App* preset = app.add_subcommand("preset", "Work on preset files in a folder");
  preset->require_subcommand(1);
  CLI::App* presetList = preset->add_subcommand("list", "List the sets, or the presets of SET");
  CLI::App* presetShow = preset->add_subcommand("show", "Print a preset's values");
  CLI::App* presetAdd = preset->add_subcommand("add", "Add a document's style as a preset");
  CLI::App* presetDelete = preset->add_subcommand("delete", "Delete a preset");
  CLI::App* presetRecover =
      preset->add_subcommand("recover", "Move a damaged set file aside and start the set afresh");
  for (CLI::App* command : {presetList, presetShow, presetAdd, presetDelete, presetRecover})
    command->add_option("--folder", folder, "Folder of the preset files")->required();
  presetList->add_option("set", set, "Preset set");
  for (CLI::App* command : {presetShow, presetAdd, presetDelete, presetRecover})
    command->add_option("set", set, "Preset set")->required();
  presetShow->add_option("name", name, "Preset name")->required();
  presetDelete->add_option("name", name, "Preset name")->required();
  presetAdd->add_option("document", document, "Document holding the style, or -")->required();
  presetAdd->add_option("style", style, "Style to add")->required();
  presetAdd->add_option("--name", name, "Preset name (default: the style's name)");
  presetAdd->add_flag("--replace", replace, "Replace a preset of that name");

  for (CLI::App* command : {validate, list, show, flatten, diff, format, report, graph, convert,
                            presetList, presetShow, presetAdd, presetDelete, presetRecover})
    AddCommonOptions(*command, options);

  int status = kSuccess;
  const std::string unknown = UnknownCommand(app, arguments);
  if (!unknown.empty()) {
    Output::Error("", unknown + "; \"styles --help\" lists the commands");
    status = kUsage;
  } else {
    try {
      app.parse(argc, argv);
    } catch (const CLI::Success& done) { // --help and --version
      app.exit(done);
      return Output::Finish(kSuccess) ? kSuccess : kUnreadable;
    } catch (const CLI::ParseError& error) {
      Output::Error("", error.what());
      status = kUsage;
    }
  }
  // Standard input holds one document.
  std::vector<std::string> inputs = documents;
  for (const std::string* path : {&document, &otherDocument, &into, &options.schema})
    inputs.push_back(*path);
  if (status == kSuccess && std::count(inputs.begin(), inputs.end(), "-") > 1) {
    Output::Error("", "standard input (-) can be read only once");
    status = kUsage;
  }
  if (status == kSuccess && formatOptions.inPlace && document == "-") {
    Output::Error("", "--in-place needs a file, not standard input");
    status = kUsage;
  }
  // Word files are read under the Word schema unless a schema is named.
  const bool word = status == kSuccess && options.schema.empty() &&
                    (convert->parsed() || AnyWordDocument(inputs));
  if (status != kSuccess ||
      !(word ? RegisterWordSchema(status) : RegisterSchemaFile(options.schema, status)))
    return Output::Finish(status) ? status : kUnreadable;

  try {
    if (validate->parsed())
      status = Validate(options, documents);
    else if (list->parsed())
      status = List(options, document);
    else if (show->parsed())
      status = Show(options, document, style, explain);
    else if (flatten->parsed())
      status = Flatten(options, document, style, lossy);
    else if (diff->parsed())
      status = Diff(options, document, otherDocument, effective);
    else if (format->parsed())
      status = Format(options, document, formatOptions);
    else if (report->parsed())
      status = Report(options, document, outputFile, otherDocument);
    else if (graph->parsed())
      status = Graph(options, document);
    else if (convert->parsed())
      status = Convert(options, document, into, outputFile);
    else if (presetList->parsed())
      status = PresetList(options, folder, set);
    else if (presetShow->parsed())
      status = PresetShow(options, folder, set, name);
    else if (presetAdd->parsed())
      status = PresetAdd(options, folder, set, document, style, name, replace);
    else if (presetDelete->parsed())
      status = PresetDelete(options, folder, set, name);
    else if (presetRecover->parsed())
      status = PresetRecover(options, folder, set);
  } catch (const std::exception& error) {
    // Lookups can still fail on sheets the checks let through; say so
    // rather than end abruptly.
    Output::Error("", std::string("cannot complete the command: ") + error.what());
    status = kUnusable;
  }
  word ? DeregisterWordSchema() : DeregisterSchemaFile();
  if (!Output::Finish(status) && status < kUnreadable)
    status = kUnreadable;
  return status;
}
