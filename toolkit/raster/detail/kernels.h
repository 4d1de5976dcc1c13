#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <tuple>

namespace krv::raster::detail
{

// The types of which values are made; complex ones have two parts.
using PartTypes = std::tuple<std::uint8_t, std::int8_t, std::uint16_t, std::int16_t, std::uint32_t, std::int32_t, float,
                             std::uint64_t, std::int64_t, double>;
inline constexpr std::size_t PART_COUNT = std::tuple_size_v<PartTypes>;
inline constexpr std::array<std::size_t, PART_COUNT> PART_BYTES = {1, 1, 2, 2, 4, 4, 4, 8, 8, 8};

// Packed values from one part type to another. Nothing need be aligned.
using Converter = void (*)(const unsigned char* pSource, unsigned char* pTarget, std::size_t nCount);

// How many of nCount values are not what they were converted from, NaN aside that is still NaN. Both lie nStride values
// apart.
using ChangeCounter = std::size_t (*)(const unsigned char* pSource, const unsigned char* pTarget, std::size_t nCount,
                                      std::size_t nStride);

// What one load gives to a vector; both are of the kernels' own length.
struct MergeTerm
{
    const unsigned char* mpSource; // of the load, and of those of the periods after it
    std::size_t mnPeriodBytes;
    const unsigned char* mpShuffle; // for each byte of the vector its place in the load, or 0x80 for 0
};

// Makes nPeriods vectors, each the union of its terms, 0 without any, and writes their values, converted, nPeriodBytes
// apart. Returns how many of them changed, as ChangeCounter has it.
using MergeLoop = std::size_t (*)(const MergeTerm* pTerms, std::size_t nTerms, unsigned char* pTarget,
                                  std::size_t nPeriodBytes, std::size_t nPeriods);

// Packed values of a number of bytes in the other byte order, in place or to elsewhere.
using Swapper = void (*)(const unsigned char* pSource, unsigned char* pTarget, std::size_t nCount);

// The inner loops, compiled for one instruction set.
struct Kernels
{
    template <typename TFunction>
    using Pairs = std::array<TFunction, PART_COUNT * PART_COUNT>; // [source * PART_COUNT + target]

    Pairs<Converter> moConverters;
    Pairs<ChangeCounter> moCounters;
    Pairs<MergeLoop> moMerges;         // null where values take a conversion of their own; without vectors everywhere
    std::size_t mnVectorBytes = 0;     // of a merged vector
    std::size_t mnLoadBytes = 0;       // of the load of a term
    std::array<Swapper, 3> moSwappers; // of 2, 4 and 8 bytes

    Converter GetConverter(std::size_t nSource, std::size_t nTarget) const
    {
        return moConverters[nSource * PART_COUNT + nTarget];
    }
    ChangeCounter GetCounter(std::size_t nSource, std::size_t nTarget) const
    {
        return moCounters[nSource * PART_COUNT + nTarget];
    }
    MergeLoop GetMerge(std::size_t nSource, std::size_t nTarget) const
    {
        return moMerges[nSource * PART_COUNT + nTarget];
    }
};

// For this processor.
const Kernels& GetKernels();

const Kernels& GetBaselineKernels();
const Kernels& GetAvx2Kernels();
const Kernels& GetAvx512Kernels();

} // namespace krv::raster::detail
