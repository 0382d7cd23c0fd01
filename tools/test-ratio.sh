#!/usr/bin/env bash
# Prints test code as a share of the rest of the code: non-blank lines that are
# not whole-line // comments, of the .h and .cpp files git knows (tracked or
# not ignored). Test code is what lives under tests/ and fuzz/; benchmarks count
# as neither. Exits 1 when the share is above the limit given (default 0.38).
set -euo pipefail
cd "$(dirname "$0")/.."
limit=${1:-0.38}
count() { xargs -r cat 2>/dev/null | grep -cvE '^\s*(//.*)?$' || true; }
sources=$(git ls-files -co --exclude-standard | grep -E '\.(h|hpp|cpp|cc)$')
tests=$(printf '%s\n' "$sources" | grep -E '(^|/)(tests?|fuzz)/' | count)
code=$(printf '%s\n' "$sources" | grep -vE '(^|/)(tests?|fuzz|benchmarks?)/' | count)
awk -v t="$tests" -v c="$code" -v limit="$limit" 'BEGIN {
  ratio = c > 0 ? t / c : 0
  printf "test code: %d lines, other code: %d lines, ratio %.2f (limit %.2f)\n", t, c, ratio, limit
  exit ratio > limit ? 1 : 0
}'
