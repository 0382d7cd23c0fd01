#!/usr/bin/env python3
"""Plants realistic single faults in the library, the toolkit and the command,
one at a time, and tells which ones the test suite catches.

Each fault names a piece of text that must occur exactly once among the files
of its area; the script replaces it, rebuilds, runs the suite (stopping at the
first failure), and restores the file. A fault whose text is no longer found
(the code moved on) is reported as stale, not counted. The build is the
sanitizer build, so leaks, double frees and use after free count as caught.

Usage: tools/mutate.py [--build-dir DIR] [--only ID[,ID...]] [--list]
"""

import argparse
import glob
import os
import re
import subprocess
import sys
import time

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))

LIBRARY = ["Engines/Styles/Styles/**/*.cpp", "Engines/Styles/Styles/**/*.h"]
PLATFORM = ["Engines/Platform/**/*.cpp", "Engines/Platform/**/*.h"]
TOOLKIT = ["Engines/StylesTools/**/*.cpp", "Engines/StylesTools/**/*.h"]
COMMAND = ["tools/styles/*.cpp", "tools/styles/*.h"]

# (id, area, what the fault is, text, replacement)
FAULTS = [
    # Lookup and inheritance
    ("inherited-reads-self", LIBRARY, "wrong variable: the inherited lookup reads the style itself",
     "if (const ZelUtils::Any* own = parent->m_properties.Find(key))",
     "if (const ZelUtils::Any* own = current->m_properties.Find(key))"),
    ("owner-counterpart", LIBRARY, "wrong variable: owner-based inheritance starts at the owner",
     "const Style* counterpart = ownerWithParent->m_parent;",
     "const Style* counterpart = ownerWithParent;"),
    ("get-out-default", LIBRARY, "dropped check: the out form reports the category default",
     "  if (&value == &behaviour->GetDefaultValue())\n    return false;\n  out = value;\n  return true;\n}\n\nbool Style::GetInheritedProperty",
     "  out = value;\n  return true;\n}\n\nbool Style::GetInheritedProperty"),
    ("path-default-category", LIBRARY, "wrong variable: a path off the own substyles ends in the root's default",
     "      if (!category)\n        throw std::exception();\n      return category->GetDefaultValue(last);",
     "      if (!category)\n        throw std::exception();\n      return m_category->GetDefaultValue(last);"),
    # Editing
    ("copy-set-stores-empty", LIBRARY, "dropped check: the copying SetProperty stores an empty result",
     "  if (!result.IsEmpty())\n    m_properties.Insert(key, std::move(result));",
     "  m_properties.Insert(key, std::move(result));"),
    ("move-set-no-destroy", LIBRARY, "missing call: the moving SetProperty leaks the old value",
     "    behaviour->DestroyPropertyData(*old);\n    // The destroy step may have edited the values: look again.",
     "    // The destroy step may have edited the values: look again."),
    ("category-frees-nothing", LIBRARY, "dropped check: a change of category leaks orphaned substyles",
     "if (behaviour && holdsSubstyles && (!next || typeid(*next) != typeid(*behaviour))) {",
     "if (false && behaviour && holdsSubstyles) {"),
    ("category-drops-plain", LIBRARY, "inverted condition: a change of category frees plain values",
     "if (behaviour && holdsSubstyles && (!next || typeid(*next) != typeid(*behaviour))) {",
     "if (behaviour && (!next || typeid(*next) != typeid(*behaviour))) {"),
    ("revert-short-circuit", LIBRARY, "short circuit: reverting skips later single substyles",
     "removed = (*substyle)->RevertAllProperties() || removed;",
     "removed = removed || (*substyle)->RevertAllProperties();"),
    # Property storage
    ("map-insert-no-shift", LIBRARY, "missing step: an insert before other keys leaves their keys behind",
     "    keys[j] = keys[j - 1];\n    values[j] = std::move(values[j - 1]);",
     "    values[j] = std::move(values[j - 1]);"),
    ("map-erase-leak", LIBRARY, "missing call: erasing the last value leaks what it holds",
     "  values[count - 1].~Any();\n  --m_block->size;",
     "  --m_block->size;"),
    ("map-grow-drops-last", LIBRARY, "off by one: growing the block loses the last entry",
     "  block->size = static_cast<std::uint32_t>(size());",
     "  block->size = static_cast<std::uint32_t>(size() ? size() - 1 : 0);"),
    ("map-mask-erase", LIBRARY, "missing step: erasing forgets the other keys' lookup bits",
     "  for (std::size_t j = 0; j + 1 < count; ++j)\n    m_keyMask |= MaskBit(keys[j]);",
     ""),
    ("map-mask-move", LIBRARY, "missing copy: a moved map loses its lookup bits",
     "m_keyMask(other.m_keyMask)", "m_keyMask(0)"),
    # Comparison
    ("order-size", LIBRARY, "wrong comparison: ordering by map size reversed",
     "return m_properties.size() < other.m_properties.size();",
     "return m_properties.size() > other.m_properties.size();"),
    ("order-swapped", LIBRARY, "swapped arguments: value ordering reversed",
     "return behaviour->IsLess(mine.second, theirs.second);",
     "return behaviour->IsLess(theirs.second, mine.second);"),
    ("equal-unregistered", LIBRARY, "dropped check: a key without behaviour counts as equal",
     "if (!behaviour || !behaviour->IsEqual(mine.second, theirs.second))\n      return false;",
     "if (behaviour && !behaviour->IsEqual(mine.second, theirs.second))\n      return false;"),
    # Registry
    ("reverse-order", LIBRARY, "wrong order: behaviours deleted in registration order",
     "for (auto key = m_categoryOrder.rbegin(); key != m_categoryOrder.rend(); ++key) {",
     "for (auto key = m_categoryOrder.begin(); key != m_categoryOrder.end(); ++key) {"),
    ("untranslate-no-case", LIBRARY, "wrong comparison: UI names match in any letter case",
     "if (entry.second->GetUIName().Compare(uiName, kCompareCaseSensitive) == 0)",
     "if (entry.second->GetUIName().CompareNoCase(uiName) == 0)"),
    ("substyle-set-flag", LIBRARY, "dropped check: every category joins the ordinary styles",
     "  if (addToStyleCategory)\n    m_substyleSetCategories.push_back(key);",
     "  m_substyleSetCategories.push_back(key);"),
    # Substyles
    ("substyle-no-owner", LIBRARY, "missing call: a copied substyle names no owner",
     "  Style* copy = new Style(*source);\n  copy->SetOwner(owner, GetName());",
     "  Style* copy = new Style(*source);"),
    ("substyle-merge-overwrite", LIBRARY, "wrong argument: merging into an own substyle always overwrites",
     "own->MergeProperties(sourceSubstyle, overwrite);",
     "own->MergeProperties(sourceSubstyle, true);"),
    ("substyle-dependency-self", LIBRARY, "dropped check: a substyle in the span is no dependency",
     "return styles.contains(substyle) || substyle->HasDependency(styles, false);",
     "return substyle->HasDependency(styles, false);"),
    ("array-destroy", LIBRARY, "missing call: destroying an array leaks its substyles",
     "  for (Style* substyle : HeldList(value))\n    delete substyle;",
     "  (void)HeldList(value);"),
    # Dependencies, merging, flattening
    ("remove-dependency-once", LIBRARY, "off by one: only the nearest removed parent is merged in",
     "while (m_parent && styles.contains(m_parent))\n      MergeParent();",
     "if (m_parent && styles.contains(m_parent))\n      MergeParent();"),
    ("merge-parent-cuts", LIBRARY, "wrong value: merging a parent in cuts the chain above it",
     "  MergeParentProperties(parent);\n  m_parent = parent->m_parent;",
     "  MergeParentProperties(parent);\n  m_parent = nullptr;"),
    ("flatten-keeps-parent", LIBRARY, "missing step: a flattened style keeps its parent",
     "  m_parent = nullptr;\n  return !flattenedKeys.empty();",
     "  return !flattenedKeys.empty();"),
    ("parental-owner", LIBRARY, "dropped check: an owner's parent is no parental dependency",
     "if (m_parent || (m_owner && m_owner->m_parent))",
     "if (m_parent)"),
    # Serialisation
    ("minimum-version", LIBRARY, "off by one: a value of the document's own version is not written",
     "  if (sheet.GetVersion() < GetMinimumVersion())\n    return false;\n  out = JsonValue();\n  if (m_policy)",
     "  if (sheet.GetVersion() <= GetMinimumVersion())\n    return false;\n  out = JsonValue();\n  if (m_policy)"),
    ("bool-text", LIBRARY, "swapped values: JSON true reads as 0",
     'converted = *flag ? u"1" : u"0";', 'converted = *flag ? u"0" : u"1";'),
    ("temporary-inverted", LIBRARY, "inverted condition: temporary values written only when excluded",
     "if (!behaviour || (!includeTemporary && behaviour->IsTemporary()))",
     "if (!behaviour || (includeTemporary && behaviour->IsTemporary()))"),
    ("text-temporary-inverted", LIBRARY, "inverted condition: written text holds temporary values only when told not to",
     "if (behaviour && (m_includeTemporary || !behaviour->IsTemporary())) {",
     "if (behaviour && (!m_includeTemporary || !behaviour->IsTemporary())) {"),
    ("plain-minimum-version", LIBRARY, "off by one: a plain value of the document's own version is not written",
     "if (plan.kind == kGeneral || m_sheet.GetVersion() >= behaviour->GetMinimumVersion())",
     "if (plan.kind == kGeneral || m_sheet.GetVersion() > behaviour->GetMinimumVersion())"),
    ("plain-derived-behaviour", LIBRARY, "wrong check: a host's own StyleProperty is read and written as a plain one",
     "  if (type == typeid(StyleProperty)) {", "  if (dynamic_cast<const StyleProperty*>(&behaviour)) {"),
    ("behaviour-slot-taken", LIBRARY, "wrong loop: a behaviour takes the slot of another whose key collides",
     "  while (table[slot].second)\n    slot = (slot + 1) & (table.size() - 1);",
     "  if (table[slot].second)\n    slot = (slot + 1) & (table.size() - 1);"),
    # Sheets
    ("cycle-refusal", LIBRARY, "inverted condition: import accepts a parent that closes a cycle",
     "if (FindRoot(above) == node) {", "if (FindRoot(above) != node) {"),
    ("cycle-forgets-link", LIBRARY, "missing call: a refused link also drops the style's old parent",
     "Attach(node, Find(current));", "(void)current;"),
    ("delete-no-repair", LIBRARY, "missing call: deleting styles leaves children pointing at them",
     "      style->RemoveDependency(doomed, true);\n  for (Style* style : styles) {",
     "      (void)style;\n  for (Style* style : styles) {"),
    ("rename-onto-taken", LIBRARY, "dropped check: renaming onto a taken name",
     "  } else if (!taken) {\n    Style* style = entry->style;",
     "  } else {\n    Style* style = entry->style;"),
    ("valid-name-trim", LIBRARY, "missing call: valid style names keep outer spaces",
     "  result.Trim();\n  return result;", "  return result;"),
    ("substyle-path-order", LIBRARY, "missing step: a substyle handle's path runs inside out",
     "  std::reverse(m_path.begin(), m_path.end());\n}", "}"),
    # Presets
    ("preset-no-commit", LIBRARY, "dropped call: a preset save never puts the file in place",
     "if (!file.Write(bytes, &m_lastSaveError) || !file.Commit(&m_lastSaveError))",
     "if (!file.Write(bytes, &m_lastSaveError))"),
    ("atomic-mode", PLATFORM, "dropped call: a replaced file's permission bits are lost",
     "    if (::fchmod(m_descriptor, existing.st_mode & 07777) != 0) {", "    if (false) {"),
    ("stale-live-writer", PLATFORM, "inverted condition: a live writer's temporary file is removed",
     "|| writerStart != startTime;", "|| writerStart == startTime;"),
    ("preset-keeps-dependencies", LIBRARY, "missing call: a preset keeps references to the source sheet",
     "  copy->RemoveAllDependencies();\n", ""),
    ("set-name-backslash", LIBRARY, "dropped check: a set name may hold a backslash",
     "if (c == u'/' || c == u'\\\\' || c == u'\\0')", "if (c == u'/' || c == u'\\0')"),
    ("set-list-extension", LIBRARY, "dropped check: files of any extension are listed as sets",
     "if (GetFileName(name) == file && IsValidSetName(name))", "if (IsValidSetName(name))"),
    # Platform: case folding, names, numbers
    ("fold-ascii-off-by-one", PLATFORM, "off by one: 'A' does not fold",
     "return (c >= 'A' && c <= 'Z') ? c + ('a' - 'A') : c;",
     "return (c > 'A' && c <= 'Z') ? c + ('a' - 'A') : c;"),
    ("fold-kelvin", PLATFORM, "wrong operator: a non-ASCII unit that folds to ASCII is compared raw",
     "if (!IsAscii(ca) || !IsAscii(cb))\n      return rest(a.substr(i), b.substr(i));",
     "if (!IsAscii(ca) && !IsAscii(cb))\n      return rest(a.substr(i), b.substr(i));"),
    ("unused-name-space", PLATFORM, "inverted condition: a trailing number counts without its space",
     "text[digitsStart - 1] == u' ')", "text[digitsStart - 1] != u' ')"),
    ("decimal-trailing-zero", PLATFORM, "dropped check: numbers keep a trailing zero",
     "    if (rest % 10 != 0)\n      *last++", "    *last++"),
    ("decimal-pair-order", PLATFORM, "wrong order: the two digits of a pair are swapped",
     "    *--digit = static_cast<char16_t>(pair[1]);\n    *--digit = static_cast<char16_t>(pair[0]);",
     "    *--digit = static_cast<char16_t>(pair[0]);\n    *--digit = static_cast<char16_t>(pair[1]);"),
    ("json-negative-zero", PLATFORM, "dropped check: negative zero is written as -0",
     '    if (digits == "-0")\n      digits = "-0.0";\n', ""),
    ("json-depth", PLATFORM, "off by one: the nesting limit lets one more level through",
     "if (++m_depth > kMaxDepth + 1)", "if (++m_depth > kMaxDepth + 2)"),
    ("document-escaped-in-place", PLATFORM, "dropped check: a string with escapes is read from the raw text",
     "m_source.substr(quote + 1, length) == std::u16string_view(text, length))",
     "true)"),
    ("document-number-leading-zero", PLATFORM, "dropped rule: a leading zero takes the digits after it",
     "    if (end < m_source.size() && m_source[end] == u'0')\n      ++end; // a leading zero stands alone\n    else\n      digits();",
     "    digits();"),
    ("index-slot-position", LIBRARY, "off by one: the first filed name reads as a free slot",
     "m_slots[i] = Slot{static_cast<std::uint32_t>(hash), entry->position + 1};",
     "m_slots[i] = Slot{static_cast<std::uint32_t>(hash), entry->position};"),
    ("json-escape-low-hex", PLATFORM, "wrong variable: a control character's low hex digit repeats the high one",
     "*out++ = kHexDigits[c & 0xF];", "*out++ = kHexDigits[c >> 4];"),
    ("json-word-quote", PLATFORM, "dropped check: a quote inside a run of four units is copied raw",
     "hasZero(units ^ (u'\"' * kOnes)) | ", ""),
    ("json-pair-wrong-unit", PLATFORM, "wrong variable: the low half of a pair is looked for in the high one",
     "if (IsHighSurrogate(c) && next != end && IsLowSurrogate(*next)) {",
     "if (IsHighSurrogate(c) && next != end && IsLowSurrogate(c)) {"),
    ("json-close-after-name", PLATFORM, "dropped check: an object closes right after a member name",
     " ||\n      (!isArray && m_levels.back().valueCount % 2 != 0)", ""),
    ("json-member-any-place", PLATFORM, "dropped check: a member is written where a value belongs",
     "return !m_levels.empty() && !m_levels.back().inArray && m_levels.back().valueCount % 2 == 0;",
     "return !m_levels.empty() && !m_levels.back().inArray;"),
    ("json-second-root", PLATFORM, "dropped check: a second value at the root is written",
     "  if (m_hasRoot)\n    return false;\n  m_hasRoot = true;", "  m_hasRoot = true;"),
    ("json-vector-backslash", PLATFORM, "dropped check: a backslash inside a run of eight units is copied raw",
     "  const __m128i backslash = _mm_cmpeq_epi16(units, _mm_set1_epi16(u'\\\\'));",
     "  const __m128i backslash = _mm_setzero_si128();"),
    ("text-reuse-keeps-tail", PLATFORM, "missing call: a reused string keeps the end of its old text",
     "  m_text.resize(m_size);\n  m_units = nullptr;", "  m_units = nullptr;"),
    ("escape-tail-overlap", PLATFORM, "off by one: the last word of a clean text lands a unit late",
     "std::memcpy(out - 4, &units, sizeof units);", "std::memcpy(out - 3, &units, sizeof units);"),
    ("copy-units-tail", PLATFORM, "missing step: a quoted name loses its units after the last whole word",
     "  if (i < count) // the last word overlaps what is copied already\n    std::memcpy(out + count - 4, from + count - 4, 8);\n",
     ""),
    ("members-comma", PLATFORM, "missing step: members written together lack their commas",
     "      if (level.valueCount > 0)\n        *out++ = u',';\n", ""),
    ("substyle-fast-with-temporary", LIBRARY, "dropped check: substyles written with temporary values when the sheet's are",
     "    if (m_includeTemporary && (plan.kind == kSubstyle || plan.kind == kSubstyleList))\n      plan.kind = kGeneral;\n",
     ""),
    ("number-exponent-form", PLATFORM, "off by one: 100000 is written whole, not in the exponent form",
     "if (fraction == 0 && whole >= 100000 && ExponentIsShorter(whole))",
     "if (fraction == 0 && whole > 100000 && ExponentIsShorter(whole))"),
    # The quick scan of documents, the folding table and reading values in place
    ("scan-control-unit", PLATFORM, "off by one: the quick scan lets U+001F stand in a string",
     "      if (c < 0x20 || c == u'\\\\' || (c & 0xF800) == 0xD800) {",
     "      if (c < 0x1F || c == u'\\\\' || (c & 0xF800) == 0xD800) {"),
    ("scan-exponent-limit", PLATFORM, "wrong constant: the quick scan takes a zero with an exponent beyond 308",
     "if (!negative && exponent > 308)", "if (!negative && exponent > 308000)"),
    ("scan-close-mismatch", PLATFORM, "wrong check: the quick scan closes an array with a brace",
     "if (*p != (top.isObject ? u'}' : u']'))", "if (*p != u'}' && *p != u']')"),
    ("scan-escaped-surrogate", PLATFORM, "dropped check: the quick scan decodes an escaped surrogate",
     "          if (code >= 0xD800 && code <= 0xDFFF)\n            return nullptr;\n", ""),
    ("scan-trailing-text", PLATFORM, "dropped check: the quick scan ignores text after the root",
     "          if (p != m_end)\n            return false;\n", ""),
    ("fold-table-offset", PLATFORM, "off by one: the folding table is read one unit early",
     "return c < kFoldTableEnd ? table[c - 0x80] : kNotSingle;",
     "return c < kFoldTableEnd ? table[c - 0x7F] : kNotSingle;"),
    ("fold-table-longer", PLATFORM, "dropped check: a unit folding to two units keeps the first only",
     "if (U_SUCCESS(status) && length == 1)", "if (U_SUCCESS(status) && length >= 1)"),
    ("read-plain-repeat", LIBRARY, "dropped call: a repeated plain member keeps the first value",
     "  if (!properties.Insert(behaviour.GetName(), std::move(value)))\n    *properties.Find(behaviour.GetName()) = std::move(value);",
     "  properties.Insert(behaviour.GetName(), std::move(value));"),
    ("read-plain-rejected", LIBRARY, "wrong result: a number the policy rejects is dropped, not read the general way",
     "    } catch (const ZelPref::Detail::BadConversion&) {\n      return false;\n    }\n  } else {",
     "    } catch (const ZelPref::Detail::BadConversion&) {\n      return true;\n    }\n  } else {"),
    ("read-substyle-owner", LIBRARY, "dropped call: a substyle read in place has no owner",
     "    substyle->SetOwner(&style, behaviour.GetName());\n", ""),
    # Toolkit
    ("provenance-owner-source", TOOLKIT, "missing step: values through the owner's parent count as ancestors",
     "    source = ValueSource::Owner;\n", ""),
    ("provenance-ancestor", TOOLKIT, "wrong variable: the source names the child of the ancestor",
     "return Resolution{own, source, parent, nullptr, owner};",
     "return Resolution{own, source, current, nullptr, owner};"),
    ("describe-order", TOOLKIT, "wrong order: a substyle path is described inside out",
     "for (auto key = keys.rbegin(); key != keys.rend(); ++key)",
     "for (auto key = keys.begin(); key != keys.end(); ++key)"),
    ("resolution-cache-holder", TOOLKIT, "wrong variable: a chain's shared result names the child",
     "result = Resolution{own, ValueSource::Ancestor, parent, nullptr, nullptr};",
     "result = Resolution{own, ValueSource::Ancestor, current, nullptr, nullptr};"),
    ("per-style-flattened", TOOLKIT, "dropped check: flattening copies a per-style value from the parent",
     "return !m_property.perStyle && StyleProperty::FlattenProperty(style, key);",
     "return StyleProperty::FlattenProperty(style, key);"),
    ("per-style-cache", TOOLKIT, "missing step: the resolution cache climbs parents for a per-style value",
     "  if (PerStyle(style.GetCategory().get(), key))\n    return DefaultOf(style.GetCategory().get(), key, nullptr);\n  std::vector<const Style*> pending{&style};",
     "  std::vector<const Style*> pending{&style};"),
    ("table-formats-ignored", ["Engines/StylesWord/**/*.cpp"], "missing step: a cell's conditional formats do not override the table",
     "    if (conditional.holder)\n      table = conditional;", "    (void)conditional;"),
    ("diff-always-effective", TOOLKIT, "dropped check: every diff lists effective changes",
     "if (effective && itA->second && itB->second)", "if (itA->second && itB->second)"),
    ("diff-swapped-order", TOOLKIT, "swapped arguments: added and removed styles exchanged",
     ": itA->first.CompareNoCase(itB->first);", ": itB->first.CompareNoCase(itA->first);"),
    ("diff-equal-values", TOOLKIT, "dropped check: equal values are reported as changed",
     "      if (valueA && valueB && behaviour->IsEqual(*valueA, *valueB))\n        continue;\n", ""),
    ("schema-maximum", TOOLKIT, "wrong comparison: the maximum itself is refused",
     "(!property.maximum || number <= *property.maximum);",
     "(!property.maximum || number < *property.maximum);"),
    # The command
    ("preset-unchecked-save", COMMAND, "dropped check: a preset edit succeeds when its save wrote nothing",
     "if (presets.Save(FromUtf8(set)) && !presets.LastSaveFailed())", "if (presets.Save(FromUtf8(set)))"),
    ("diff-exit-status", COMMAND, "wrong value: a diff with differences exits 0",
     "return differences.empty() ? kSuccess : kNegative;", "return kSuccess;"),
    ("positions-skipped", COMMAND, "inverted condition: diagnostics read from a document get no line",
     "return d.line == 0 && !d.pointer.IsEmpty();", "return d.line != 0 && !d.pointer.IsEmpty();"),
    ("stdin-name", COMMAND, "wrong value: standard input is not named as such",
     'return path == "-" ? "<stdin>" : path;', "return path;"),
    ("report-script-escape", COMMAND, "wrong value: the report's data lets \"</script>\" end its script",
     "if (c == u'<')", "if (c == u'>')"),
    ("graph-dot-escape", COMMAND, "dropped check: DOT text leaves backslashes unescaped",
     "if (c == '\"' || c == '\\\\')", "if (c == '\"')"),
    ("graph-list-index", COMMAND, "off by one: substyle list paths count from 1",
     "FromUtf8(std::to_string(i))", "FromUtf8(std::to_string(i + 1))"),
]


def files_of(patterns):
    found = []
    for pattern in patterns:
        found.extend(glob.glob(os.path.join(ROOT, pattern), recursive=True))
    return sorted(set(found))


def locate(patterns, text):
    """The one file holding `text` exactly once, or None."""
    hits = []
    for path in files_of(patterns):
        with open(path, encoding="utf-8") as f:
            count = f.read().count(text)
        hits.extend([path] * count)
    return hits[0] if len(hits) == 1 else None


def run(command, log, timeout):
    try:
        result = subprocess.run(command, cwd=ROOT, stdout=log, stderr=subprocess.STDOUT,
                                timeout=timeout)
        return result.returncode
    except subprocess.TimeoutExpired:
        return "timeout"


def configure(build_dir, log):
    return run(["cmake", "-S", ".", "-B", build_dir, "-DCMAKE_BUILD_TYPE=Debug",
                "-DSTYLES_SANITIZE=ON", "-DSTYLES_BUILD_EXAMPLES=OFF"], log, 600)


def build(build_dir, log):
    return run(["cmake", "--build", build_dir, "-j", str(os.cpu_count() or 2)], log, 1800)


def gtest_programs(build_dir):
    return sorted(p for p in glob.glob(os.path.join(build_dir, "tests", "*Tests"))
                  if os.access(p, os.X_OK))


def other_tests(build_dir):
    """The CTest tests that are not cases of a GoogleTest program: those run
    through CTest, the cases in one process per program, which is much faster."""
    listed = subprocess.run(["ctest", "--test-dir", build_dir, "-N"], capture_output=True,
                            text=True).stdout
    names = [line.split(": ", 1)[1].strip() for line in listed.splitlines()
             if line.strip().startswith("Test") and ": " in line]
    cases = set()
    for program in gtest_programs(build_dir):
        suite = ""
        for line in subprocess.run([program, "--gtest_list_tests"], capture_output=True,
                                   text=True).stdout.splitlines():
            if not line.startswith(" "):
                suite = line.split()[0] if line.strip() else ""
            else:
                cases.add(suite + line.split()[0])
    return [n for n in names if n not in cases]


def test(build_dir, log):
    env = os.environ.copy()
    env["ASAN_OPTIONS"] = "detect_leaks=1"
    env["UBSAN_OPTIONS"] = "halt_on_error=1:print_stacktrace=1"
    try:
        for program in gtest_programs(build_dir):
            result = subprocess.run([program, "--gtest_fail_fast", "--gtest_brief=1"],
                                    cwd=os.path.dirname(program),
                                    stdout=log, stderr=subprocess.STDOUT, env=env, timeout=300)
            if result.returncode != 0:
                return result.returncode
        others = other_tests(build_dir)
        if not others:
            return 0
        pattern = "^(" + "|".join(re.escape(n) for n in others) + ")$"
        result = subprocess.run(["ctest", "--test-dir", build_dir, "-R", pattern,
                                 "-j", str(os.cpu_count() or 2), "--stop-on-failure",
                                 "--timeout", "120"],
                                cwd=ROOT, stdout=log, stderr=subprocess.STDOUT, env=env,
                                timeout=1800)
        return result.returncode
    except subprocess.TimeoutExpired:
        return "timeout"


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--build-dir", default="build-mutate")
    parser.add_argument("--only", default="")
    parser.add_argument("--list", action="store_true")
    args = parser.parse_args()

    chosen = [f for f in FAULTS if not args.only or f[0] in args.only.split(",")]
    if args.list:
        for fault in chosen:
            where = locate(fault[1], fault[3])
            print(f"{fault[0]:28} {os.path.relpath(where, ROOT) if where else 'STALE'}")
        return 0

    build_dir = os.path.join(ROOT, args.build_dir)
    os.makedirs(build_dir, exist_ok=True)
    log_path = os.path.join(build_dir, "mutate.log")
    with open(log_path, "w") as log:
        if configure(build_dir, log) != 0 or build(build_dir, log) != 0 or test(build_dir, log) != 0:
            print(f"the unmutated build or suite fails; see {log_path}")
            return 2

    caught = survived = stale = broken = 0
    survivors = []
    for fault_id, patterns, description, text, replacement in chosen:
        path = locate(patterns, text)
        if not path:
            print(f"stale     {fault_id}: its text is gone or not unique")
            stale += 1
            continue
        with open(path, encoding="utf-8") as f:
            original = f.read()
        started = time.time()
        try:
            with open(path, "w", encoding="utf-8") as f:
                f.write(original.replace(text, replacement, 1))
            with open(os.path.join(build_dir, f"mutate-{fault_id}.log"), "w") as log:
                built = build(build_dir, log)
                outcome = test(build_dir, log) if built == 0 else None
        finally:
            with open(path, "w", encoding="utf-8") as f:
                f.write(original)
        seconds = time.time() - started
        if outcome is None:
            verdict, broken = "no-build", broken + 1
        elif outcome == 0:
            verdict, survived = "SURVIVED", survived + 1
            survivors.append(fault_id)
        else:
            verdict, caught = "caught", caught + 1
        print(f"{verdict:9} {fault_id}: {description} "
              f"({os.path.relpath(path, ROOT)}, {seconds:.0f} s)", flush=True)

    # Leaves the build as the sources are.
    with open(log_path, "a") as log:
        build(build_dir, log)
    counted = caught + survived
    share = 100.0 * caught / counted if counted else 0.0
    print(f"\n{caught} caught, {survived} survived of {counted} faults ({share:.0f}%); "
          f"{stale} stale, {broken} did not build")
    if survivors:
        print("survivors: " + ", ".join(survivors))
    return 0 if counted and share >= 90.0 else 1


if __name__ == "__main__":
    sys.exit(main())
