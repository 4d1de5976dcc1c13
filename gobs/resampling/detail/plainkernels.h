#pragma once

#include "gobs/raster/datatype.h"
#include "gobs/resampling/resampling.h"

#include <cstddef>

namespace krv::gobs::detail
{

// Places all of whose pixels are at hand and valid; kernels that are not stretched.
struct PlainJob
{
    const unsigned char* mpPixels; // of the window; readable bytes follow the last one
    std::size_t mnRowSamples;      // from row to row
    double mnLeft;                 // the centre of the window's first pixel
    double mnTop;
    const double* mpX;
    const double* mpY;
    std::size_t mnCount;
    unsigned char* mpResult; // interleaved; nothing is written behind the last one
    bool mbClamp;            // cubic: to the range of the pixels that are weighed
};

using PlainLoop = void (*)(const PlainJob& oJob);
constexpr unsigned int MOST_PLAIN_SAMPLES = 4;

// The loop for this processor: bilinear or cubic, pixels of 1 to MOST_PLAIN_SAMPLES samples of 8U, 16U, 16S or 32R;
// null for anything else. Sums are in 32R.
PlainLoop FindPlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);

// The same, compiled for one instruction set.
PlainLoop FindBaselinePlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);
PlainLoop FindAvx2PlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);
PlainLoop FindAvx512PlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);

} // namespace krv::gobs::detail
