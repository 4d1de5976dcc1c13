#!/usr/bin/env bash
# The faults that .clang-tidy looks for, in every source of what is installed. Names the places and fails.
# Usage: tidy.sh BUILD, a folder with compile_commands.json
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../.."
CHECKER=${CLANG_TIDY:-clang-tidy-16}
BUILD=$1

# A planted fault first: a check that cannot fail is none.
oPlanted=$(mktemp -d)
trap 'rm -rf "$oPlanted"' EXIT
printf '#include <string>\nauto f(std::string s) { auto t = std::move(s); return s.size(); }\n' >"$oPlanted/planted.cpp"
# The checker's own result is no guide: it is an error when it sees the fault.
"$CHECKER" --quiet --config-file=.clang-tidy "$oPlanted/planted.cpp" -- -std=c++20 >"$oPlanted/seen" 2>&1 || true
if ! grep -q bugprone-use-after-move "$oPlanted/seen"; then
    echo "$CHECKER does not see a planted fault" >&2
    exit 1
fi

if ! find toolkit gobs datasources operations plugins tools -name '*.cpp' -print0 |
    xargs -0 -n 4 -P "$(nproc)" "$CHECKER" --quiet -p "$BUILD" >"$oPlanted/findings" 2>&1; then
    grep -vE '^[0-9]+ warnings? (generated|treated)' "$oPlanted/findings" >&2
    exit 1
fi
echo "$CHECKER finds nothing"
