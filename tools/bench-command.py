#!/usr/bin/env python3
"""The styles command on a large document: time and peak memory.

Writes a chain of 1,000,000 paragraph styles (S0000000 ... S0999999, each
inheriting from the one before and setting spaceAfter) into a temporary
folder, runs `styles validate` and `styles show ... --explain` on it and
prints, for each, the wall time and the peak resident memory that reading
the document added (peak RSS less that of `styles --version`), against the
goal: at most 2.5 times the document's UTF-16 text plus what the sheet keeps
(measured by SheetKeptMemory; validate builds no sheet).

Usage: tools/bench-command.py [BUILD_DIR] [--styles N]
Exits 1 when a command fails; a goal that is not met only shows in the table.
"""

import argparse
import os
import subprocess
import sys
import tempfile
import time


def write_chain(path, count):
    """The chain document, compact, one style after another."""
    with open(path, "w", encoding="utf-8") as out:
        out.write('{"version":1,"paragraph":{')
        for i in range(count):
            parent = ',"inherits":"S%07d"' % (i - 1) if i else ""
            out.write('%s"S%07d":{"spaceAfter":"%d"%s}' % ("," if i else "", i, i % 100, parent))
        out.write("}}")


def run(command):
    """Wall time in seconds and peak RSS in bytes of one run of `command`."""
    start = time.perf_counter()
    child = subprocess.Popen(command, stdout=subprocess.DEVNULL, stderr=subprocess.PIPE)
    _, status, usage = os.wait4(child.pid, 0)
    seconds = time.perf_counter() - start
    child.returncode = os.waitstatus_to_exitcode(status)
    errors = child.stderr.read().decode("utf-8", "replace")
    child.stderr.close()
    if child.returncode != 0:
        sys.exit("%s failed with status %d: %s" % (" ".join(command), child.returncode, errors))
    return seconds, usage.ru_maxrss * 1024  # Linux gives kilobytes


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("build", nargs="?", default="build-bench")
    parser.add_argument("--styles", type=int, default=1000000)
    options = parser.parse_args()
    styles = os.path.join(options.build, "tools", "styles", "styles")
    probe = os.path.join(options.build, "benchmarks", "SheetKeptMemory")
    for program in (styles, probe):
        if not os.access(program, os.X_OK):
            sys.exit("%s is missing: build with -DSTYLES_BUILD_BENCHMARKS=ON first" % program)

    with tempfile.TemporaryDirectory(prefix="styles-bench-") as folder:
        document = os.path.join(folder, "chain.json")
        write_chain(document, options.styles)
        last = "S%07d" % (options.styles - 1)
        measured = subprocess.run([probe, document], check=True, capture_output=True, text=True)
        figures = dict(line.split() for line in measured.stdout.splitlines())
        kept, text = int(figures["kept_bytes"]), int(figures["utf16_bytes"])
        _, idle = run([styles, "--version"])

        mb = 1e6
        print("\nThe styles command on a chain of %d styles (%.1f MB of UTF-8, %.1f MB as UTF-16;"
              " a sheet keeps %.1f MB of it)" % (options.styles, os.path.getsize(document) / mb,
                                                 text / mb, kept / mb))
        print("%-62s %-26s %-18s %s" % ("figure", "measured", "goal", "met"))
        for name, command, sheet in (
                ("validate", [styles, "validate", document], 0),
                ("show --explain", [styles, "show", document, last, "--explain"], kept)):
            seconds, peak = run(command)
            added = peak - idle
            goal = 2.5 * text + sheet
            print("%-62s %-26s %-18s %s" % (
                "styles %s: peak memory / (2.5x UTF-16 text + kept)" % name,
                "%.2fx (%.0f MB, %.1f s)" % (added / goal, added / mb, seconds),
                "<= 1.00x (%.0f MB)" % (goal / mb), "yes" if added <= goal else "NO"))


if __name__ == "__main__":
    main()
