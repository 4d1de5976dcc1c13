#pragma once

#include "toolkit/api.h"

#include <array>

namespace krv::ogc::cs
{

// The affine transform of an image from raster to map coordinates:
//     x = XOffset + XPerColumn * column + XPerRow * row
//     y = YOffset + YPerColumn * column + YPerRow * row
// Raster coordinates are continuous: (0, 0) is the outer corner of the first pixel, (0.5, 0.5) its centre. Map
// coordinates are in the unit of the image's reference system, x towards the east (longitude), y towards the north
// (latitude), whatever order of axes an authority gives that system. A reduced image of the same ground keeps the
// offsets and has the other terms multiplied by the reduction. A plain value.
class KRV_TOOLKIT_API GeocodingInfo
{
public:
    // Map coordinates equal raster coordinates: 0, 1, 0, 0, 0, 1.
    GeocodingInfo();
    GeocodingInfo(double nXOffset, double nXPerColumn, double nXPerRow, double nYOffset, double nYPerColumn,
                  double nYPerRow);

    // The two offsets are the map coordinates of the outer corner of the first pixel, in map units; the other terms are
    // map units for one pixel. North-up images have a negative YPerRow.
    double GetXOffset() const { return moTerms[0]; }
    double GetXPerColumn() const { return moTerms[1]; }
    double GetXPerRow() const { return moTerms[2]; }
    double GetYOffset() const { return moTerms[3]; }
    double GetYPerColumn() const { return moTerms[4]; }
    double GetYPerRow() const { return moTerms[5]; }

    // The six terms in the order of the constructor.
    // XOffset, XPerColumn, XPerRow, YOffset, YPerColumn, YPerRow.
    const std::array<double, 6>& GetTerms() const { return moTerms; }

    // Any position, inside the image or not; nothing is rounded. GeocodingInfo(x, 10, 0, y, 0, -10) maps (0.5, 0.5) to
    // (x + 5, y - 5).
    void RasterToMap(double nColumn, double nRow, double& nX, double& nY) const;

    // The inverse. False, with the results untouched, when the transform has none (IsInvertible).
    // A position inside the image has a column from 0 to its width: the pixel's number is the whole part.
    bool MapToRaster(double nX, double nY, double& nColumn, double& nRow) const;

    // Whether all terms are finite and the area of a pixel is not zero within the accuracy of the terms.
    bool IsInvertible() const;

    // Whether this is exactly the default, that is, an image without georeferencing.
    bool IsIdentity() const;

    // Whether rows or columns are not parallel to the map axes.
    // Also true for a shear. Such images have no single east edge.
    bool IsRotated() const;

    // Ground size of a pixel along a row and along a column, in map units, never negative.
    // The length of a step of one column on the map: the root of XPerColumn^2 + YPerColumn^2; of one row likewise.
    double GetColumnSpacing() const;
    double GetRowSpacing() const;

    // Exact comparison of the six terms.
    bool operator==(const GeocodingInfo& oOther) const;

private:
    double Determinant() const;

    std::array<double, 6> moTerms;
};

} // namespace krv::ogc::cs
