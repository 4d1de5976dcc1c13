#pragma once

namespace krv::simd
{

// Which of the instruction sets that loops are compiled for beside the least one this processor has: one list for all
// loops, and the one of the options that the build compiles them with (krv_vector_options). For sources that choose,
// which are compiled for the least processor themselves.

// Asked once for a whole run of work, not in a loop: the answer never changes while the process lives.
inline bool RunsAvx2()
{
#if defined(__x86_64__)
    return __builtin_cpu_supports("avx2") && __builtin_cpu_supports("fma") && __builtin_cpu_supports("bmi2");
#else
    return false;
#endif
}

// Shuffles across a whole vector (VBMI) came with the second generation of these processors, as did GFNI; the first
// slows down on long vectors and stays with the shorter ones.
// False wherever RunsAvx2 is false. Results do not depend on either: every loop gives the same bits on every processor.
inline bool RunsAvx512()
{
#if defined(__x86_64__)
    return RunsAvx2() && __builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512bw") &&
           __builtin_cpu_supports("avx512dq") && __builtin_cpu_supports("avx512vl") &&
           __builtin_cpu_supports("avx512vbmi") && __builtin_cpu_supports("gfni");
#else
    return false;
#endif
}

} // namespace krv::simd
