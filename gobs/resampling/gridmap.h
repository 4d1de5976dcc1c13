#pragma once

#include "gobs/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <array>
#include <cstddef>

namespace krv::gobs
{

// Where the pixels of an image lie in another one, from which they are made. Positions are continuous: pixel (x, y)
// covers [x, x + 1) by [y, y + 1). Any thread. The order of the virtual operations is public and fixed.
class KRV_GOBS_API IGridMap
{
public:
    virtual ~IGridMap();

    // The places of the centres of nCount pixels of a row, from pixel (nX, nY) on; NaN where there is none.
    virtual void MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const = 0;

    // What a step of one pixel along the row is there, x and y, and what one along the column is, around a place.
    virtual std::array<double, 4> GetFootprint(double nX, double nY) const = 0;
};

// x = XOffset + XPerColumn * column + XPerRow * row, and y likewise.
class KRV_GOBS_API AffineMap : public IGridMap
{
public:
    // From columns and rows of the result to those of the source. Throws ParameterException for terms that are not
    // finite and a map that has no inverse.
    explicit AffineMap(const krv::ogc::cs::GeocodingInfo& oTerms);
    // Between two grids over the same map coordinates: of the result, and of the source. What is a whole number but for
    // rounding is one. Throws the same.
    AffineMap(const krv::ogc::cs::GeocodingInfo& oResult, const krv::ogc::cs::GeocodingInfo& oSource);
    ~AffineMap() override;

    const krv::ogc::cs::GeocodingInfo& GetTerms() const { return moTerms; }
    // Whether columns and rows of the result are such of the source, in this order.
    bool IsGrid() const { return moTerms.GetXPerRow() == 0 && moTerms.GetYPerColumn() == 0; }

    void MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const override;
    std::array<double, 4> GetFootprint(double nX, double nY) const override;

private:
    krv::ogc::cs::GeocodingInfo moTerms;
};

// The transform that does oFirst and then oSecond: map coordinates of the latter from columns and rows of the former.
KRV_GOBS_API krv::ogc::cs::GeocodingInfo Compose(const krv::ogc::cs::GeocodingInfo& oFirst,
                                                 const krv::ogc::cs::GeocodingInfo& oSecond);

} // namespace krv::gobs
