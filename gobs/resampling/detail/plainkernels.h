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
    bool mbClamp;            // cubic: to the range of the pixels in reach
};

using PlainLoop = void (*)(const PlainJob& oJob);
constexpr unsigned int MOST_PLAIN_SAMPLES = 4;

// The loop for this processor: bilinear or cubic, pixels of 1 to MOST_PLAIN_SAMPLES samples of 8U, 16U, 16S or 32R;
// null for anything else. Sums are in 32R.
PlainLoop FindPlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);

// The pixels of an axis that make one of the result, and where their weights begin in a list.
struct Taps
{
    long long mnFirst = 0;
    long long mnEnd = 0;
    std::size_t mnWeights = 0;
};

// A row of the result along the axes: samples of several rows are weighed into sums, and these along the row.
struct RowJob
{
    const unsigned char* mpPixels = nullptr; // the first sample that is needed, in the first row
    std::size_t mnRowSamples = 0;            // from row to row
    std::size_t mnRows = 0;
    const float* mpRowWeights = nullptr;
    std::size_t mnSums = 0;    // samples of a row that are needed
    float* mpSums = nullptr;   // SUM_PADDING more are readable, as behind the following
    float* mpLowest = nullptr; // null unless results keep to the range of what is in reach
    float* mpHighest = nullptr;

    const Taps* mpTaps = nullptr; // of the pixels to make
    const float* mpWeights = nullptr;
    long long mnFirst = 0; // the pixel that the sums begin with
    std::size_t mnCount = 0;
    std::size_t mnSamples = 0; // of a pixel
    unsigned char* mpResult = nullptr;
};
constexpr std::size_t SUM_PADDING = 4;

struct RowLoops
{
    void (*mpAddRows)(const RowJob& oJob) = nullptr;
    void (*mpMakePixels)(const RowJob& oJob) = nullptr;
};

// The loops for this processor, of 8U, 16U, 16S or 32R; none for anything else. Sums are in 32R.
RowLoops FindRowLoops(NativeDataTypeCode ePart);

// The same, compiled for one instruction set.
RowLoops FindBaselineRowLoops(NativeDataTypeCode ePart);
RowLoops FindAvx2RowLoops(NativeDataTypeCode ePart);
RowLoops FindAvx512RowLoops(NativeDataTypeCode ePart);
PlainLoop FindBaselinePlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);
PlainLoop FindAvx2PlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);
PlainLoop FindAvx512PlainLoop(Resampling eMethod, NativeDataTypeCode ePart, std::size_t nSamples);

} // namespace krv::gobs::detail
