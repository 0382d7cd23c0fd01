#!/bin/bash
# Kills "styles preset add --replace" at random moments against a large preset
# set, then reports what the kills did: runs that died, damaged sets, lost
# presets, and files left in the folder before and after one more ordinary
# save (which must leave only the set's file).
#
#   tests/stress/preset-kills.sh STYLES_PROGRAM [KILLS=1000] [PRESETS=3000] [MAX_MS=35]
set -u
program=${1:?usage: $0 STYLES_PROGRAM [KILLS] [PRESETS] [MAX_MS]}
kills=${2:-1000}
presets=${3:-3000}
max_ms=${4:-35}
sample=$(cd "$(dirname "$0")/../.." && pwd)/examples/sample-sheet.json
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
folder=$work/pf

# The set is generated, not kept: one paragraph preset a line of the document.
mkdir "$folder"
python3 - "$folder/Big.qsty" "$presets" <<'PY'
import json, sys
path, count = sys.argv[1], int(sys.argv[2])
presets = {"Preset %05d" % i: {"spaceBefore": str(i % 40), "spaceAfter": str(i % 12),
                               "alignment": ["left", "right", "center", "justify"][i % 4],
                               "character": {"fontName": "Font %d" % (i % 50),
                                             "fontSize": str(8 + i % 30), "colour": "#00AA%02X" % (i % 256)}}
           for i in range(count)}
with open(path, "w") as out:
    json.dump({"version": 1, "paragraph": presets}, out)
PY
echo "set: $presets presets, $(stat -c %s "$folder/Big.qsty") bytes"

count_presets() { "$program" preset list --folder "$folder" Big 2>/dev/null | grep -c '^Preset '; }
[ "$(count_presets)" = "$presets" ] || { echo "the generated set does not load"; exit 1; }

died=0 damaged=0 lost=0
for ((run = 0; run < kills; run++)); do
  "$program" preset add --folder "$folder" Big "$sample" "Heading 1" --name X --replace \
    >/dev/null 2>&1 &
  pid=$!
  sleep "$(printf '0.%03d' $((RANDOM % (max_ms + 1))))"
  kill -KILL "$pid" 2>/dev/null
  wait "$pid" 2>/dev/null
  [ $? -ge 128 ] && died=$((died + 1))
  if ! "$program" preset list --folder "$folder" Big >/dev/null 2>&1; then
    damaged=$((damaged + 1))
  elif [ "$(count_presets)" != "$presets" ]; then
    lost=$((lost + 1))
  fi
done
left_before=$(find "$folder" -mindepth 1 ! -name Big.qsty | wc -l)
"$program" preset add --folder "$folder" Big "$sample" "Heading 2" --name Y --replace >/dev/null
left_after=$(find "$folder" -mindepth 1 ! -name Big.qsty | wc -l)
echo "kills: $kills, died before finishing: $died"
echo "damaged sets: $damaged, sets that lost presets: $lost"
echo "files beside the set after the kills: $left_before, after one more save: $left_after"
[ "$damaged" = 0 ] && [ "$lost" = 0 ] && [ "$left_after" = 0 ]
