#pragma once

#include "toolkit/api.h"

#include <optional>

namespace krv::ogc::cs
{

class GeocodingInfo;

// A rectangle of pixels, from its first column and row.
// Columns and rows count from 0. A width or height of 0 is an empty window.
struct PixelWindow
{
    unsigned int x = 0;
    unsigned int y = 0;
    unsigned int width = 0;
    unsigned int height = 0;
};

// A rectangle in map coordinates, in the unit of a reference system; west is below east, south below north.
// Outer edges of pixels, not their centres.
struct MapBounds
{
    double west = 0;
    double south = 0;
    double east = 0;
    double north = 0;
};

// The smallest rectangle that holds the image of so many pixels.
// Of a rotated image it is larger than the image itself. nWidth, nHeight: pixels; parts of one are allowed.
KRV_TOOLKIT_API MapBounds OutlineOf(const GeocodingInfo& oInfo, double nWidth, double nHeight);

// The pixels of an image of that size that the bounds touch, those that are no more than a millionth aside: of a
// rotated image the smallest window that holds them. Nothing when the bounds hold no pixel or the transform has no
// inverse.
KRV_TOOLKIT_API std::optional<PixelWindow> WindowOf(const GeocodingInfo& oInfo, unsigned int nWidth,
                                                    unsigned int nHeight, const MapBounds& oBounds);

} // namespace krv::ogc::cs
