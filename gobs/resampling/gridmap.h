#pragma once

#include "gobs/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <array>
#include <cstddef>

namespace krv::gobs
{

// Where the pixels of an image lie in another one, from which they are made. Positions are continuous: pixel (x, y)
// covers [x, x + 1) by [y, y + 1). Any thread. The order of the virtual operations is public and fixed.
// A map of one's own makes a reader over any projection: TransformRasterReader asks it row by row.
class KRV_GOBS_API IGridMap
{
public:
    virtual ~IGridMap();

    // The places of the centres of nCount pixels of a row, from pixel (nX, nY) on; NaN where there is none.
    // pX, pY: nCount numbers each, of the caller; both are NaN for a place that cannot be had.
    virtual void MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const = 0;

    // What a step of one pixel along the row is there, x and y, and what one along the column is, around a place.
    // For choosing levels and widening kernels: approximate is enough. nX, nY: of the result, in pixels.
    virtual std::array<double, 4> GetFootprint(double nX, double nY) const = 0;
};

// x = XOffset + XPerColumn * column + XPerRow * row, and y likewise.
// Example: half the size: AffineMap(GeocodingInfo(0, 2, 0, 0, 0, 2)).
class KRV_GOBS_API AffineMap : public IGridMap
{
public:
    // From columns and rows of the result to those of the source. Throws ParameterException for terms that are not
    // finite and a map that has no inverse.
    // Continuous columns and rows: half a pixel is the centre of the first one, in both.
    explicit AffineMap(const krv::ogc::cs::GeocodingInfo& oTerms);
    // Between two grids over the same map coordinates: of the result, and of the source. What is a whole number but for
    // rounding is one. Throws the same.
    // Both in one reference system: a map between systems is an IGridMap of one's own.
    AffineMap(const krv::ogc::cs::GeocodingInfo& oResult, const krv::ogc::cs::GeocodingInfo& oSource);
    ~AffineMap() override;

    const krv::ogc::cs::GeocodingInfo& GetTerms() const { return moTerms; }
    // Whether columns and rows of the result are such of the source, in this order.
    // Such maps are resampled along the axes one after the other (gridrows.h), which is quicker.
    bool IsGrid() const { return moTerms.GetXPerRow() == 0 && moTerms.GetYPerColumn() == 0; }

    void MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const override;
    std::array<double, 4> GetFootprint(double nX, double nY) const override;

private:
    krv::ogc::cs::GeocodingInfo moTerms;
};

// The transform that does oFirst and then oSecond: map coordinates of the latter from columns and rows of the former.
// oSecond takes what oFirst gives as its columns and rows.
KRV_GOBS_API krv::ogc::cs::GeocodingInfo Compose(const krv::ogc::cs::GeocodingInfo& oFirst,
                                                 const krv::ogc::cs::GeocodingInfo& oSecond);

} // namespace krv::gobs
