#pragma once

#include "operations/picture/reduction.h"

#include <cstdint>

namespace krv::operations
{

// How values become grey levels.
enum class StretchMode
{
    eAuto,       // as they are for 8-bit data that uses at least half of the range, else by percentiles
    eNone,       // as they are, 0 to 255
    ePercentile, // the 2nd percentile becomes 0, the 98th 255
    eMinMax
};

// A linear map from values to 0 ... 255.
struct KRV_OPERATIONS_API Stretch
{
    float low = 0;
    float high = 255;

    // A map without extent shows everything as middle grey.
    std::uint8_t operator()(float nValue) const;
};

// The map for a plane; only pixels with coverage count. bEightBit: the channel's type is 8-bit unsigned.
KRV_OPERATIONS_API Stretch FindStretch(const Plane& oPlane, StretchMode eMode, bool bEightBit);

} // namespace krv::operations
