#pragma once

#include "operations/picture/reduction.h"

#include <cstdint>

namespace krv::operations
{

// How values become grey levels.
// Percentiles and extremes are those of the reduced picture, valid pixels alone.
enum class StretchMode
{
    eAuto,       // 8-bit data as they are when they are colours or use at least half of the range, else by percentiles
    eNone,       // as they are, 0 to 255
    ePercentile, // the 2nd percentile becomes 0, the 98th 255
    eMinMax      // the smallest value becomes 0, the largest 255
};

// A linear map from values to 0 ... 255.
struct KRV_OPERATIONS_API Stretch
{
    float low = 0;
    float high = 255;

    // A map without extent shows everything as middle grey.
    // Values beyond the ends become 0 or 255. nValue is a number, not NaN.
    std::uint8_t operator()(float nValue) const;
};

// The map for a plane; only pixels with coverage count. bEightBit: the channel's type is 8-bit unsigned. bColour: the
// file says that it is one of three colours, which a map of its own would shift.
KRV_OPERATIONS_API Stretch FindStretch(const Plane& oPlane, StretchMode eMode, bool bEightBit, bool bColour = false);

// Of planes of one size the pixels that belong to a collar: zero in all of them and joined to the border of the image
// by such pixels. Scenes are turned within their rectangle, and often nothing says what fills it up. Empty when fewer
// than one in a hundred are.
KRV_OPERATIONS_API std::vector<bool> FindCollar(const std::vector<Plane>& oPlanes);

} // namespace krv::operations
