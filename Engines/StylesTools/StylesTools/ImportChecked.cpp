// ImportChecked of Diagnostics.h: an all-or-nothing import through a scratch
// sheet, built on the document's validation.
#include <StylesTools/Diagnostics.h>

#include <Internal/MemberPositions.h>
#include <Internal/ParsedDocument.h>
#include <Internal/ToolsSupport.h>

#include <Styles/Style.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>

#include <algorithm>
#include <exception>
#include <map>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

namespace Styles {
namespace Tools {

using detail::ParseDocument;
using detail::Text;
using detail::ValidateParsed;
using detail::Widen;

namespace {

// Marks the stand-ins of target styles in the scratch sheet. No document can
// give a style this external name: JSON text cannot hold an unpaired surrogate.
const Text& StandInMark() {
  static const Text mark(std::u16string(1, char16_t(0xD800)) + u"stand-in");
  return mark;
}

// ImportChecked once the document has been validated (`found`): `read`
// imports the document into the scratch sheet, and may let go of it then, so
// that it is not held beside both sheets while the new styles move into the
// target.
template <class Read>
bool ImportValidated(StyleSheet& target, std::vector<Diagnostic> found, bool replace,
                     std::vector<Diagnostic>* diagnostics, const Read& read) {
  const auto finish = [&](bool imported) {
    if (diagnostics)
      *diagnostics = std::move(found);
    return imported;
  };
  if (HasErrors(found))
    return finish(false);

  // The scratch sheet starts as an image of the target: one empty stand-in
  // per target style, under its name and category, linked as the originals.
  StyleSheet scratch;
  scratch.SetVersion(target.GetVersion());
  scratch.SetExternalID(target.GetExternalID());
  std::unordered_map<const Style*, Style*> standIns;
  std::unordered_set<const Style*> standInSet;
  for (const Text& name : target.GetStyleNames()) {
    const Style* original = target.GetStyle(name);
    Style* standIn =
        new Style(nullptr, original ? original->GetCategoryName() : PropertyKey::Empty);
    standIn->SetExternalName(StandInMark());
    standIns.emplace(original, standIn);
    standInSet.insert(standIn);
    scratch.AddStyle(name, standIn, false);
  }
  for (const auto& [original, standIn] : standIns)
    if (original && original->GetParent()) {
      const auto parent = standIns.find(original->GetParent());
      if (parent != standIns.end())
        standIn->SetParent(parent->second);
    }

  try {
    read(scratch);
  } catch (const std::exception& error) {
    found.push_back(Diagnostic{
        Severity::Error, "behaviour-failed", Text(),
        u"reading the document failed (" + Widen(error.what()) + u"); nothing was imported", 0, 0});
    return finish(false);
  } catch (...) {
    found.push_back(Diagnostic{Severity::Error, "behaviour-failed", Text(),
                               u"reading the document failed; nothing was imported", 0, 0});
    return finish(false);
  }

  // Stand-ins still in the scratch sheet map back to their originals; the
  // other styles are the import's. A replaced stand-in was destroyed, and its
  // address may have been reused by a new style, hence the mark.
  std::map<Style*, Style*> toOriginals;
  std::vector<std::pair<Text, Style*>> created;
  {
    std::vector<Text> names = scratch.GetStyleNames();
    const std::vector<Style*> styles = scratch.GetStyles(); // the same order
    created.reserve(names.size() - std::min(names.size(), standInSet.size()));
    for (std::size_t i = 0; i < names.size(); ++i) {
      Style* style = styles[i];
      if (style && standInSet.count(style) && style->GetExternalName() == StandInMark())
        toOriginals.emplace(style, target.GetStyle(names[i]));
      else
        created.emplace_back(std::move(names[i]), style);
    }
  }
  for (auto& [name, style] : created) {
    scratch.RemoveStyle(style);
    if (style && !toOriginals.empty())
      style->RemapDependency(toOriginals);
  }

  // Into the target, as the import's first pass would file them: a replaced
  // style leaves, and every target style that referred to it refers to its
  // successor.
  std::map<Style*, Style*> successors;
  for (auto& [name, style] : created) {
    if (replace)
      if (Style* previous = target.RemoveStyle(name))
        successors.emplace(previous, style);
    target.AddStyle(name, style, false);
  }
  if (!successors.empty()) {
    std::unordered_set<const Style*> createdSet;
    for (const auto& entry : created)
      createdSet.insert(entry.second);
    for (Style* style : target.GetStyles())
      if (style && !createdSet.count(style))
        style->RemapDependency(successors);
    for (const auto& entry : successors)
      delete entry.first;
  }
  target.SetVersion(scratch.GetVersion());
  target.SetExternalID(scratch.GetExternalID());
  return finish(true);
}

// ImportChecked on `text`, letting go of `release` (which may be `text`
// itself) once the scratch sheet has read it; diagnostics of members get no
// positions.
bool ImportText(StyleSheet& target, const Text& text, Text& release, bool replace,
                std::vector<Diagnostic>* diagnostics) {
  std::vector<Diagnostic> found;
  {
    Json::Document document;
    if (!ParseDocument(text, document, found)) {
      if (diagnostics)
        *diagnostics = std::move(found);
      return false;
    }
    found = ValidateParsed(document, &target, replace);
  }
  // The scratch import parses the text again rather than keep the parse
  // beside the scratch sheet.
  return ImportValidated(target, std::move(found), replace, diagnostics, [&](StyleSheet& scratch) {
    scratch.ImportFromString(text, replace);
    const Text dropped(std::move(release)); // frees its storage
  });
}
} // namespace

bool ImportChecked(StyleSheet& target, const Text& text, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  Text unused;
  const bool imported = ImportText(target, text, unused, replace, diagnostics);
  if (diagnostics && !diagnostics->empty())
    detail::LocateMembers(text, *diagnostics);
  return imported;
}

bool ImportChecked(StyleSheet& target, Text&& text, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  return ImportText(target, text, text, replace, diagnostics);
}

bool ImportChecked(StyleSheet& target, Json::Object& document, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  return ImportValidated(target, ValidateDocument(document, &target, replace), replace, diagnostics,
                         [&](StyleSheet& scratch) { scratch.ImportJson(&document, replace); });
}

bool ImportChecked(StyleSheet& target, Json::Object&& document, bool replace,
                   std::vector<Diagnostic>* diagnostics) {
  return ImportValidated(target, ValidateDocument(document, &target, replace), replace, diagnostics,
                         [&](StyleSheet& scratch) {
                           scratch.ImportJson(&document, replace);
                           document = Json::Object();
                         });
}

} // namespace Tools
} // namespace Styles
