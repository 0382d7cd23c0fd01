// The commands of the styles program, one function each, over the toolkit.
// Each returns the process's exit status:
//   0 success, 1 a negative answer (errors found, differences, no such style
//   or preset), 2 bad usage (also a malformed schema), 3 a file or folder
//   that cannot be read or written, 4 a document whose errors keep it from
//   being used, or a rewrite that would lose part of it.
#pragma once

#include "Output.h"

#include <StylesTools/Diagnostics.h>

#include <string>
#include <vector>

namespace Styles {
class StyleSheet;
} // namespace Styles

namespace StylesCommand {

enum ExitStatus : int { kSuccess = 0, kNegative = 1, kUsage = 2, kUnreadable = 3, kUnusable = 4 };

// Options every command takes.
struct CommonOptions {
  std::string schema; // empty: the built-in schema
  bool json = false;
};

// Registers the schema for the life of the process's commands; false (with
// the status in `status`) when it cannot be read or registered.
bool RegisterSchemaFile(const std::string& path, int& status);
// Takes out what RegisterSchemaFile registered, once no style is left.
void DeregisterSchemaFile();

// How messages name the file `path`: "<stdin>" for "-".
std::string DisplayName(const std::string& path);

// How a command takes what reading a document cannot keep: a read-only one
// ignores it, a rewriting one refuses it or (with --lossy) warns.
enum class Loss { Ignore, Refuse, Accept };

// Reads the document `path` (JSON or Word) into `sheet` all or nothing; a Word
// file's warnings go to `warnings`. kSuccess, or the status of the problem printed.
int LoadSheet(const std::string& path, Styles::StyleSheet& sheet, Loss loss = Loss::Ignore,
              std::vector<Styles::Tools::Diagnostic>* warnings = nullptr);

int Validate(const CommonOptions& options, const std::vector<std::string>& documents);
int List(const CommonOptions& options, const std::string& document);
int Show(const CommonOptions& options, const std::string& document, const std::string& style,
         bool explain);
// Prints the flattened style, temporary values included; refuses a document
// whose reading loses content unless `lossy`.
int Flatten(const CommonOptions& options, const std::string& document, const std::string& style,
            bool lossy);
int Diff(const CommonOptions& options, const std::string& oldDocument,
         const std::string& newDocument, bool effective);
// How format writes the document.
struct FormatOptions {
  bool compact = false; // one line
  bool lossy = false;   // rewrite even when reading loses content
  std::string output;   // a file to write instead of standard output
  bool inPlace = false; // write back to the document's own file
};
// Rewrites the document in canonical form, keeping all that the sheet holds;
// refuses a document whose reading loses content unless format.lossy.
int Format(const CommonOptions& options, const std::string& document, const FormatOptions& format);
// The HTML report of `document` to `output` (standard output when empty),
// marking what changed since `against` when it is not empty.
int Report(const CommonOptions& options, const std::string& document, const std::string& output,
           const std::string& against);
// The inheritance graph of `document` as Graphviz DOT.
int Graph(const CommonOptions& options, const std::string& document);

int PresetList(const CommonOptions& options, const std::string& folder, const std::string& set);
int PresetShow(const CommonOptions& options, const std::string& folder, const std::string& set,
               const std::string& name);
int PresetAdd(const CommonOptions& options, const std::string& folder, const std::string& set,
              const std::string& document, const std::string& style, const std::string& name,
              bool replace);
int PresetDelete(const CommonOptions& options, const std::string& folder, const std::string& set,
                 const std::string& name);
// Moves a set file that does not load aside and starts the set afresh.
int PresetRecover(const CommonOptions& options, const std::string& folder, const std::string& set);

} // namespace StylesCommand
