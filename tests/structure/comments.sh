#!/usr/bin/env bash
# How much the headers that are installed say beside their declarations: lines with a comment for each line of code,
# empty lines aside. A line of code with a comment behind it counts as both, the end of a namespace as code alone. One
# for two is the aim; below 0.48 it fails and lists the headers that say least.
# Usage: comments.sh [FOLDER]
set -euo pipefail
cd "${1:-$(dirname "${BASH_SOURCE[0]}")/../..}"

mapfile -d '' oHeaders < <(find toolkit gobs datasources operations krv plugins/support -name '*.h' -not -path '*/detail/*' -not -name vectors.h -print0)
awk '
/^[[:space:]]*$/ { next }
/^[[:space:]]*\/\// { ++comments[FILENAME]; next }
{ ++code[FILENAME] }
/\/\/ / && !/^} *\/\/ namespace/ { ++comments[FILENAME] }
END {
    for (file in code) {
        allComments += comments[file]
        allCode += code[file]
    }
    printf "%d lines with comments for %d lines of code: %.3f\n", allComments, allCode, allComments / allCode
    if (allComments >= 0.48 * allCode)
        exit 0
    for (file in code)
        if (2 * comments[file] < code[file])
            printf "%5d missing: %s\n", code[file] / 2 - comments[file], file | "sort -rn | head -20"
    exit 1
}' "${oHeaders[@]}"
