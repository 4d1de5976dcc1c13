#!/usr/bin/env bash
# The check of vectors finds what it is there for: the vocabulary's words pass, each fault alone is reported.
set -euo pipefail
oHere=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
oTree=$(mktemp -d)
trap 'rm -rf "$oTree"' EXIT
mkdir -p "$oTree/toolkit/simd" "$oTree/gobs"
echo 'return _mm_add_epi8(a, b);' >"$oTree/toolkit/simd/vectors.h"

oGood='const auto o = simd::Load<simd::Bytes>(p); // not _mm_loadu_si128\nint comm_size, a_mm_b;'
check()
{
    printf '%b\n' "$1" >"$oTree/gobs/kernel.cpp"
    "$oHere/vectors.sh" "$oTree"
}

check "$oGood" || { echo "the vocabulary itself is refused" >&2; exit 1; }
nFaults=0
for oFault in 'o = _mm_or_si128(a, b);' 'const auto o=_mm512_setzero_ps();' 'n = _pext_u64(n, m);' 'const __m256i o{};' \
    'static __m128 o;' '__mmask16 n;' '#include <immintrin.h>' '#include <arm_neon.h>' \
    'typedef float Floats __attribute__((vector_size(16)));' 'return __builtin_shufflevector(a, b, 0);' \
    'if (__builtin_cpu_supports("avx2"))' '__attribute__((target("avx2"))) void Run();'; do
    if oFound=$(check "$oGood\n$oFault") || [ "$(grep -c '^gobs/kernel.cpp:3: ' <<<"$oFound")" -ne 1 ]; then
        echo "not found: $oFault (the check said: $oFound)" >&2
        exit 1
    fi
    nFaults=$((nFaults + 1))
done
echo "the vocabulary passes; $nFaults faults were found, each alone"
