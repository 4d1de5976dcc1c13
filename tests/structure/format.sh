#!/usr/bin/env bash
# Every source file is laid out by .clang-format. Names the files that are not, and fails.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../.."

# Releases of the tool differ in detail; this one is the measure.
FORMATTER=${CLANG_FORMAT:-clang-format-14}
mapfile -d '' oFiles < <(find toolkit gobs datasources operations krv plugins tools tests fuzz examples benchmarks \
    -type f \( -name '*.h' -o -name '*.cpp' \) -print0 2>/dev/null)
[ "${#oFiles[@]}" -gt 0 ] || { echo "no source files found" >&2; exit 1; }
"$FORMATTER" --dry-run -Werror "${oFiles[@]}" 2>&1 | sed -n 's/^\([^ :]*\):[0-9]*:[0-9]*: error: code should.*/\1/p' | sort -u >&2
# The list above is for reading; this is the verdict.
"$FORMATTER" --dry-run -Werror "${oFiles[@]}" 2>/dev/null || { echo "not laid out by .clang-format: run $FORMATTER -i on them" >&2; exit 1; }
echo "${#oFiles[@]} files are laid out by .clang-format"
