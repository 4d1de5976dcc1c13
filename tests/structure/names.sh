#!/usr/bin/env bash
# The dialect of names, for the tree below FOLDER (default: this project).
set -euo pipefail
oHere=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
cd "${1:-$oHere/../..}"

mapfile -d '' oFiles < <(find toolkit gobs datasources operations krv plugins tools -type f \( -name '*.h' -o -name '*.cpp' \) -print0 2>/dev/null | sort -z)
LC_ALL=C awk -f "$oHere/names.awk" "${oFiles[@]}"
