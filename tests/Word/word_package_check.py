#!/usr/bin/env python3
"""Edits a Word template through the styles command and checks the result.

The template goes to JSON, one value is changed there, and the JSON goes back
into a copy of the template: `styles diff` must report exactly that change.
With a new style added as well, python-docx, a reader independent of ours,
must see the same style names, base styles and values. Exits 77 (skipped) when the
python3-docx package is missing, after the command checks have passed.
"""
import json
import subprocess
import sys
from pathlib import Path

styles, template, work = sys.argv[1], sys.argv[2], Path(sys.argv[3])
work.mkdir(parents=True, exist_ok=True)


def run(*args, status=0):
    done = subprocess.run([styles, *args], capture_output=True, text=True)
    if done.returncode != status:
        sys.exit(f"styles {' '.join(args)}: status {done.returncode}\n{done.stdout}{done.stderr}")
    return done.stdout


def convert_into(sheet, name):
    edited = work / f"{name}.json"
    edited.write_text(json.dumps(sheet), encoding="utf-8")
    package = work / f"{name}.docx"
    run("convert", str(edited), "--into", template, "-o", str(package))
    return package


# One style changed: the diff reports that change and nothing else.
sheet = json.loads(run("convert", template))
sheet["paragraph"]["heading 2"]["character"]["fontSize"] = "15"
diff = run("diff", template, str(convert_into(sheet, "changed")), status=1)
expected = 'paragraph "heading 2": character.fontSize: 13 -> 15\n'
if diff != expected:
    sys.exit(f"styles diff reported:\n{diff}expected:\n{expected}")

# A new style besides, for the independent reader.
sheet["paragraph"]["House Body"] = {"inherits": "Normal", "spaceAfter": "6",
                                     "character": {"italic": "1"}}
package = convert_into(sheet, "added")

try:
    import docx
except ImportError:
    print("python3-docx is not installed; the independent reader was not run")
    sys.exit(77)

ours = json.loads(run("convert", str(package)))
document = docx.Document(str(package))
names = {style.name for style in document.styles}
for category in ("paragraph", "character", "table", "numbering"):
    for name, style in ours[category].items():
        if name.endswith(" Defaults"):
            continue
        if name not in names and name.lower() not in {n.lower() for n in names}:
            sys.exit(f"python-docx lacks the style {name!r}")
base = {style.name: style.base_style.name if getattr(style, "base_style", None) else None
        for style in document.styles}
checks = [
    (base["House Body"], "Normal"),
    (base["Heading 1"], "Normal"),
    (document.styles["Heading 2"].font.size.pt, 15.0),
    (document.styles["Heading 1"].font.size.pt, 14.0),
    (document.styles["House Body"].font.italic, True),
    (document.styles["House Body"].paragraph_format.space_after.pt, 6.0),
    (document.styles["Heading 1"].font.bold, True),
]
for got, want in checks:
    if got != want:
        sys.exit(f"python-docx read {got!r}, expected {want!r}")
print(f"python-docx agrees on {len(names)} styles")
