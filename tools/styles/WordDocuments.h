// Word files wherever a command takes a document: recognised by their
// content, read under the Word schema, their problems reported as the
// command's diagnostics; and `styles convert` between JSON documents and Word.
#pragma once

#include "Commands.h"

#include <StylesTools/Diagnostics.h>

#include <string>
#include <vector>

namespace Styles {
class StyleSheet;
} // namespace Styles

namespace StylesCommand {

// Whether `path` (standard input for "-", looked at without being consumed)
// holds a Word package or styles part.
bool IsWordDocument(const std::string& path);
// Whether any of `paths` does.
bool AnyWordDocument(const std::vector<std::string>& paths);

// Registers the Word schema for the process's commands, as RegisterSchemaFile
// registers a schema file.
bool RegisterWordSchema(int& status);
// Takes out what RegisterWordSchema registered.
void DeregisterWordSchema();

// Reads the Word file `path` into `sheet`: kSuccess (its warnings as
// diagnostics in `warnings`), kUnreadable or kUnusable, the problem printed.
int LoadWordSheet(const std::string& path, Styles::StyleSheet& sheet,
                  std::vector<Styles::Tools::Diagnostic>* warnings);
// The problems of the Word file `path` as diagnostics, codes "word-error" and
// "word-warning", with the part and element in place of a JSON Pointer. False
// when the file cannot be read at all.
bool WordDiagnostics(const std::string& path, std::vector<Styles::Tools::Diagnostic>& out);

// styles convert: a Word file to a JSON document, a JSON document to a styles
// part, or either into a copy of the package `into`; written to `output`
// ("-" for standard output).
int Convert(const CommonOptions& options, const std::string& input, const std::string& into,
            const std::string& output);

} // namespace StylesCommand
