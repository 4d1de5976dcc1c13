#pragma once

#include "gobs/raster/datatype.h"

#include <cstddef>

namespace krv::gobs::detail
{

// One step of a cascade over a block: pixel (x, y) of the result is the sum of the four pixels from (2x, 2y) on.
// Pitches are bytes from one row to the next.
struct ReduceJob
{
    const unsigned char* mpFirst; // a row of samples, or of sums of the step before, and the one below it
    const unsigned char* mpSecond;
    std::size_t mnPairPitch; // to the next two rows
    std::size_t mnWidth;     // of the result, in pixels
    std::size_t mnHeight;
    unsigned char* mpSums; // null: not wanted
    std::size_t mnSumPitch;
    unsigned char* mpMeans; // the sums divided by 2 to the power of mnShift, half to even; null: not wanted
    std::size_t mnMeanPitch;
    unsigned int mnShift;
    bool mbFetch; // samples are fetched ahead: rows follow each other in memory, and the processor does not see it
};

constexpr unsigned int MOST_LOOP_SAMPLES = 4;
using ReduceLoop = void (*)(const ReduceJob& oJob);

// The loop for this processor: for pixels of 1 to MOST_LOOP_SAMPLES samples of 8U, 16U or 32R, from samples or sums of
// nSourceBytes to sums of nSumBytes each. Unsigned integers add up in 2, 4 or 8 bytes, reals in doubles. Null for
// anything else.
ReduceLoop FindReduceLoop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                          std::size_t nSumBytes);

// The same, compiled for one instruction set.
ReduceLoop FindBaselineLoop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                            std::size_t nSumBytes);
ReduceLoop FindAvx2Loop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                        std::size_t nSumBytes);
ReduceLoop FindAvx512Loop(NativeDataTypeCode eType, unsigned int nSamples, std::size_t nSourceBytes,
                          std::size_t nSumBytes);

} // namespace krv::gobs::detail
