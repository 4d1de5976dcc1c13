#pragma once

#include <cstddef>
#include <cstdint>

#if defined(__SSE4_1__)
#define KRV_VECTOR_AVERAGES 1
#endif

namespace krv::datasources::detail
{

// Adds pixels up two by two and row by row: pixel i of the result is the sum of
// the pixels 2i and 2i + 1 of two rows, for pixels of 1, 3 or 4 samples
// (nSamples).
#if defined(KRV_VECTOR_AVERAGES)
void SumPairs(const std::uint16_t* pFirst, const std::uint16_t* pSecond, std::size_t nPairs, unsigned int nSamples,
              std::uint16_t* pSums);
void SumPairs(const std::uint16_t* pFirst, const std::uint16_t* pSecond, std::size_t nPairs, unsigned int nSamples,
              std::uint32_t* pSums);
void SumPairs(const std::uint32_t* pFirst, const std::uint32_t* pSecond, std::size_t nPairs, unsigned int nSamples,
              std::uint32_t* pSums);
void SumPairs(const float* pFirst, const float* pSecond, std::size_t nPairs, unsigned int nSamples, double* pSums);
void SumPairs(const double* pFirst, const double* pSecond, std::size_t nPairs, unsigned int nSamples, double* pSums);

// The first step of the means of bytes, with the means of its own sums when
// these are wanted: half to even.
void SumAndRoundPairs(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nPairs,
                      unsigned int nSamples, std::uint16_t* pSums, std::uint8_t* pMeans);

// As much of it as wide vectors take, of nInput bytes in a row; gives how many sums that are. Only for processors that
// have AVX2.
std::size_t SumAndRoundByAvx2(const std::uint8_t* pFirst, const std::uint8_t* pSecond, std::size_t nInput,
                              unsigned int nSamples, std::uint16_t* pSums, std::uint8_t* pMeans);

// Sums of 2 to the power of nShift samples each to their means, half to even.
void RoundSums(const std::uint16_t* pSums, std::size_t nSums, unsigned int nShift, std::uint8_t* pMeans);
void RoundSums(const std::uint32_t* pSums, std::size_t nSums, unsigned int nShift, std::uint8_t* pMeans);
void RoundSums(const std::uint32_t* pSums, std::size_t nSums, unsigned int nShift, std::uint16_t* pMeans);
void RoundSums(const double* pSums, std::size_t nSums, unsigned int nShift, float* pMeans);
#endif

} // namespace krv::datasources::detail
