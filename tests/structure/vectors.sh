#!/usr/bin/env bash
# Instructions of processors, and the compiler's own words for vectors, stand in toolkit/simd alone: every kernel speaks
# its vocabulary. For the tree below FOLDER (default: this project).
set -euo pipefail
oHere=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
cd "${1:-$oHere/../..}"

mapfile -d '' oFiles < <(find toolkit gobs datasources operations krv plugins tools -type f \( -name '*.h' -o -name '*.cpp' \) \
    ! -path 'toolkit/simd/*' -print0 2>/dev/null | sort -z)
LC_ALL=C awk '
    function complain(what) { printf "%s:%d: %s belongs to toolkit/simd\n", FILENAME, FNR, what; bad = 1 }
    FNR == 1 { ++files }
    { sub(/\/\/.*/, "") }
    /(^|[^A-Za-z0-9_])(_mm(256|512)?_[a-z]|_(pext|pdep)_u)/ { complain("an instruction") }
    /(^|[^A-Za-z0-9_])__(m(64|128|256|512)|mmask(8|16|32|64))([^A-Za-z0-9_]|[di][^A-Za-z0-9_])/ { complain("a type of the processor") }
    /mmintrin\.h|arm_neon\.h|cpuid\.h/ { complain("a header of the processor") }
    /vector_size|ext_vector_type|__builtin_(shufflevector|shuffle|convertvector|ia32_)/ { complain("a vector of the compiler") }
    /__builtin_cpu_|target_clones|gnu::target|GCC target|\(\(target/ { complain("the choice of a processor") }
    END {
        if (files < 1) {
            print "no sources were given"
            bad = 1
        }
        if (!bad)
            print files " files leave vectors to toolkit/simd"
        exit bad
    }' "${oFiles[@]}"
