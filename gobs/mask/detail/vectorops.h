#pragma once

// The few vector operations of the mask kernels, under one name for each width. All work within parts of 128 bits: the
// wider kind is two groups of pixels side by side. The kinds share no function: the wide one's code must not stand in
// for the narrow one's.
#if defined(__SSE4_2__)
#include <immintrin.h>

namespace krv::gobs::detail
{

struct SseOps
{
    using Vector = __m128i;
    static constexpr unsigned int GROUPS = 1;

    // nStride: the distance to the second group.
    static Vector Load(const unsigned char* p, unsigned long) { return Broadcast(p); }
    // The same 16 bytes for each group.
    static Vector Broadcast(const void* p) { return _mm_loadu_si128(static_cast<const __m128i*>(p)); }
    static Vector Zero() { return _mm_setzero_si128(); }
    static Vector And(Vector a, Vector b) { return _mm_and_si128(a, b); }
    static Vector Or(Vector a, Vector b) { return _mm_or_si128(a, b); }
    static Vector Xor(Vector a, Vector b) { return _mm_xor_si128(a, b); }
    static Vector Equal8(Vector a, Vector b) { return _mm_cmpeq_epi8(a, b); }
    static Vector Equal16(Vector a, Vector b) { return _mm_cmpeq_epi16(a, b); }
    static Vector Equal32(Vector a, Vector b) { return _mm_cmpeq_epi32(a, b); }
    static Vector Equal64(Vector a, Vector b) { return _mm_cmpeq_epi64(a, b); }
    static Vector EqualFloat(Vector a, Vector b) { return _mm_castps_si128(_mm_cmpeq_ps(Floats(a), Floats(b))); }
    static Vector EqualDouble(Vector a, Vector b) { return _mm_castpd_si128(_mm_cmpeq_pd(Doubles(a), Doubles(b))); }
    static Vector NaNFloat(Vector a) { return _mm_castps_si128(_mm_cmpunord_ps(Floats(a), Floats(a))); }
    static Vector NaNDouble(Vector a) { return _mm_castpd_si128(_mm_cmpunord_pd(Doubles(a), Doubles(a))); }
    static Vector Narrow16(Vector a, Vector b) { return _mm_packs_epi16(a, b); }
    static Vector Narrow32(Vector a, Vector b) { return _mm_packs_epi32(a, b); }
    static Vector EvenOf32(Vector a, Vector b) { return _mm_castps_si128(_mm_shuffle_ps(Floats(a), Floats(b), 0x88)); }
    static Vector OddOf32(Vector a, Vector b) { return _mm_castps_si128(_mm_shuffle_ps(Floats(a), Floats(b), 0xDD)); }
    static Vector EvenOf64(Vector a, Vector b) { return _mm_unpacklo_epi64(a, b); }
    static Vector OddOf64(Vector a, Vector b) { return _mm_unpackhi_epi64(a, b); }
    static Vector Pick(Vector a, Vector b) { return _mm_shuffle_epi8(a, b); }
    // The highest bits of the bytes, 16 for each group.
    static unsigned int Bits(Vector a) { return static_cast<unsigned int>(_mm_movemask_epi8(a)); }

private:
    static __m128 Floats(Vector a) { return _mm_castsi128_ps(a); }
    static __m128d Doubles(Vector a) { return _mm_castsi128_pd(a); }
};

#if defined(__AVX2__)
struct Avx2Ops
{
    using Vector = __m256i;
    static constexpr unsigned int GROUPS = 2;

    static Vector Load(const unsigned char* p, unsigned long nStride)
    {
        return _mm256_loadu2_m128i(reinterpret_cast<const __m128i*>(p + nStride), reinterpret_cast<const __m128i*>(p));
    }
    static Vector Broadcast(const void* p)
    {
        return _mm256_broadcastsi128_si256(_mm_loadu_si128(static_cast<const __m128i*>(p)));
    }
    static Vector Zero() { return _mm256_setzero_si256(); }
    static Vector And(Vector a, Vector b) { return _mm256_and_si256(a, b); }
    static Vector Or(Vector a, Vector b) { return _mm256_or_si256(a, b); }
    static Vector Xor(Vector a, Vector b) { return _mm256_xor_si256(a, b); }
    static Vector Equal8(Vector a, Vector b) { return _mm256_cmpeq_epi8(a, b); }
    static Vector Equal16(Vector a, Vector b) { return _mm256_cmpeq_epi16(a, b); }
    static Vector Equal32(Vector a, Vector b) { return _mm256_cmpeq_epi32(a, b); }
    static Vector Equal64(Vector a, Vector b) { return _mm256_cmpeq_epi64(a, b); }
    static Vector EqualFloat(Vector a, Vector b)
    {
        return _mm256_castps_si256(_mm256_cmp_ps(Floats(a), Floats(b), _CMP_EQ_OQ));
    }
    static Vector EqualDouble(Vector a, Vector b)
    {
        return _mm256_castpd_si256(_mm256_cmp_pd(Doubles(a), Doubles(b), _CMP_EQ_OQ));
    }
    static Vector NaNFloat(Vector a) { return _mm256_castps_si256(_mm256_cmp_ps(Floats(a), Floats(a), _CMP_UNORD_Q)); }
    static Vector NaNDouble(Vector a)
    {
        return _mm256_castpd_si256(_mm256_cmp_pd(Doubles(a), Doubles(a), _CMP_UNORD_Q));
    }
    static Vector Narrow16(Vector a, Vector b) { return _mm256_packs_epi16(a, b); }
    static Vector Narrow32(Vector a, Vector b) { return _mm256_packs_epi32(a, b); }
    static Vector EvenOf32(Vector a, Vector b)
    {
        return _mm256_castps_si256(_mm256_shuffle_ps(Floats(a), Floats(b), 0x88));
    }
    static Vector OddOf32(Vector a, Vector b)
    {
        return _mm256_castps_si256(_mm256_shuffle_ps(Floats(a), Floats(b), 0xDD));
    }
    static Vector EvenOf64(Vector a, Vector b) { return _mm256_unpacklo_epi64(a, b); }
    static Vector OddOf64(Vector a, Vector b) { return _mm256_unpackhi_epi64(a, b); }
    static Vector Pick(Vector a, Vector b) { return _mm256_shuffle_epi8(a, b); }
    static unsigned int Bits(Vector a) { return static_cast<unsigned int>(_mm256_movemask_epi8(a)); }

private:
    static __m256 Floats(Vector a) { return _mm256_castsi256_ps(a); }
    static __m256d Doubles(Vector a) { return _mm256_castsi256_pd(a); }
};
#endif

} // namespace krv::gobs::detail
#endif
