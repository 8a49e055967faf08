#!/usr/bin/env bash
# Lines of test code (C/C++ under tests/ and fuzz/, and hand-written test inputs other
# than golden outputs and the fuzz corpus) against the lines of everything else in
# C/C++ (src/, include/, toolkit/, winapi/, tools/, bench/).
set -euo pipefail
cd "$(dirname "$0")/.."
count() { find "$@" -type f \( -name '*.c' -o -name '*.cpp' -o -name '*.h' \) -print0 | xargs -0 cat | wc -l; }
tests=$(($(count tests fuzz) + $(find tests/anview/inputs -type f -print0 | xargs -0 cat | wc -l)))
code=$(count src include toolkit winapi tools bench)
echo "test lines: $tests"
echo "other lines: $code"
awk -v t="$tests" -v c="$code" 'BEGIN { printf "ratio: %.3f (at most 0.333)\n", t / c }'
