// styles: asks what is in a style sheet document, whether it is sound, where
// a style's effective values come from and what changed between two
// versions, and manages preset files. Commands take files or "-" for
// standard input; see Commands.h for the exit statuses.
#include "Commands.h"
#include "WordDocuments.h"

#include <CLI/CLI.hpp>

#include <exception>
#include <iostream>
#include <string>
#include <vector>

namespace {

using namespace StylesCommand;

// --schema and --json on a command; every command takes both.
void AddCommonOptions(CLI::App& command, CommonOptions& options) {
  command.add_option("--schema", options.schema,
                     "JSON schema of the categories (default: the built-in word-processor schema)");
  command.add_flag("--json", options.json, "Machine-readable output");
}

constexpr const char* kFooter =
    "Exit status: 0 success, 1 errors found, differences or nothing of that name,\n"
    "2 bad usage or schema, 3 a file that cannot be read, 4 a document with errors.";

} // namespace

int main(int argc, char** argv) {
  CLI::App app{"Inspect, check, compare and rewrite style sheet documents.", "styles"};
  app.footer(kFooter);
  app.require_subcommand(1);

  CommonOptions options;
  std::vector<std::string> documents;
  std::string document, otherDocument, style, folder, set, name, outputFile;
  bool explain = false, effective = false, compact = false, replace = false;

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
  CLI::App* diff = app.add_subcommand("diff", "Print the differences between two documents");
  diff->add_option("old", document, "Old document, or -")->required();
  diff->add_option("new", otherDocument, "New document, or -")->required();
  diff->add_flag("--effective", effective, "Also list effective values that changed");
  CLI::App* format = app.add_subcommand("format", "Rewrite a document in canonical form");
  format->add_option("document", document, "Document, or -")->required();
  format->add_flag("--compact", compact, "One line instead of indented text");

  CLI::App* report =
      app.add_subcommand("report", "Write an HTML page of the inheritance graphs and values");
  report->add_option("document", document, "Document, or -")->required();
  report->add_option("-o,--output", outputFile, "HTML file to write (default: standard output)");
  report->add_option("--against", otherDocument, "Older document whose differences are marked");
  CLI::App* graph = app.add_subcommand("graph", "Print the inheritance graph as Graphviz DOT");
  graph->add_option("document", document, "Document, or -")->required();
  std::string into, output = "-";
  CLI::App* convert = app.add_subcommand(
      "convert", "Convert between a JSON document and a Word file (a Word file gives JSON)");
  convert->add_option("input", document, "Document or Word file, or -")->required();
  convert->add_option("--into", into, "Write the styles into a copy of this Word package");
  convert->add_option("-o,--output", output, "Output file (default: standard output)");

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

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    return app.exit(error) == 0 ? kSuccess : kUsage;
  }

  int status = kSuccess;
  // Word files are read under the Word schema unless a schema is named.
  std::vector<std::string> inputs = documents;
  inputs.insert(inputs.end(), {document, otherDocument});
  const bool word = options.schema.empty() && (convert->parsed() || AnyWordDocument(inputs));
  if (word ? !RegisterWordSchema(status) : !RegisterSchemaFile(options.schema, status))
    return status;
  try {
    if (validate->parsed())
      status = Validate(options, documents);
    else if (list->parsed())
      status = List(options, document);
    else if (show->parsed())
      status = Show(options, document, style, explain);
    else if (flatten->parsed())
      status = Flatten(options, document, style);
    else if (diff->parsed())
      status = Diff(options, document, otherDocument, effective);
    else if (format->parsed())
      status = Format(options, document, compact);
    else if (report->parsed())
      status = Report(options, document, outputFile, otherDocument);
    else if (graph->parsed())
      status = Graph(options, document);
    else if (convert->parsed())
      status = Convert(options, document, into, output);
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
  return status;
}
