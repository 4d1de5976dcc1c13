#include "gobs/resampling/gridmap.h"

#include "toolkit/exceptions/exceptions.h"

#include <cmath>

namespace krv::gobs
{

using krv::ogc::cs::GeocodingInfo;

namespace
{

GeocodingInfo Invert(const GeocodingInfo& oInfo)
{
    const double a = oInfo.GetXPerColumn(), b = oInfo.GetXPerRow(), c = oInfo.GetYPerColumn(), d = oInfo.GetYPerRow();
    const double nDeterminant = a * d - b * c;
    double nColumn = 0, nRow = 0;
    if (!oInfo.IsInvertible() || !oInfo.MapToRaster(0, 0, nColumn, nRow))
        throw krv::ParameterException("The transform is singular", krv::ParameterException::eInvalidValue, "oSource");
    return {nColumn, d / nDeterminant, -b / nDeterminant, nRow, -c / nDeterminant, a / nDeterminant};
}

// Whole numbers that were missed by rounding alone: offsets within a millionth of a pixel, steps within as much over
// the width of any image.
GeocodingInfo Snap(const GeocodingInfo& oInfo)
{
    const auto Near = [](double n, double nAside)
    {
        return std::fabs(n - std::nearbyint(n)) < nAside ? std::nearbyint(n) : n;
    };
    constexpr double PIXEL = 1e-6, STEP = 1e-12;
    return {Near(oInfo.GetXOffset(), PIXEL), Near(oInfo.GetXPerColumn(), STEP), Near(oInfo.GetXPerRow(), STEP),
            Near(oInfo.GetYOffset(), PIXEL), Near(oInfo.GetYPerColumn(), STEP), Near(oInfo.GetYPerRow(), STEP)};
}

} // namespace

GeocodingInfo Compose(const GeocodingInfo& oFirst, const GeocodingInfo& oSecond)
{
    double nX = 0, nY = 0;
    oSecond.RasterToMap(oFirst.GetXOffset(), oFirst.GetYOffset(), nX, nY);
    const auto Step = [&](double nPerColumn, double nPerRow, double nByX, double nByY)
    {
        return nPerColumn * nByX + nPerRow * nByY;
    };
    return {nX,
            Step(oSecond.GetXPerColumn(), oSecond.GetXPerRow(), oFirst.GetXPerColumn(), oFirst.GetYPerColumn()),
            Step(oSecond.GetXPerColumn(), oSecond.GetXPerRow(), oFirst.GetXPerRow(), oFirst.GetYPerRow()),
            nY,
            Step(oSecond.GetYPerColumn(), oSecond.GetYPerRow(), oFirst.GetXPerColumn(), oFirst.GetYPerColumn()),
            Step(oSecond.GetYPerColumn(), oSecond.GetYPerRow(), oFirst.GetXPerRow(), oFirst.GetYPerRow())};
}

IGridMap::~IGridMap() = default;

AffineMap::AffineMap(const GeocodingInfo& oTerms) : moTerms(oTerms)
{
    if (!oTerms.IsInvertible())
        throw krv::ParameterException("The transform is singular or not finite", krv::ParameterException::eInvalidValue,
                                      "oTerms");
}

AffineMap::AffineMap(const GeocodingInfo& oResult, const GeocodingInfo& oSource)
    : AffineMap(Snap(Compose(oResult, Invert(oSource))))
{
}

AffineMap::~AffineMap() = default;

void AffineMap::MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const
{
    const double nRow = static_cast<double>(nY) + 0.5;
    const double nXByRow = moTerms.GetXPerRow() * nRow, nYByRow = moTerms.GetYPerRow() * nRow;
    const auto nFirst = static_cast<double>(nX);
    for (std::size_t n = 0; n < nCount; ++n)
    {
        const double nColumn = nFirst + static_cast<double>(static_cast<std::ptrdiff_t>(n)) + 0.5;
        pX[n] = moTerms.GetXOffset() + moTerms.GetXPerColumn() * nColumn + nXByRow;
        pY[n] = moTerms.GetYOffset() + moTerms.GetYPerColumn() * nColumn + nYByRow;
    }
}

std::array<double, 4> AffineMap::GetFootprint(double, double) const
{
    return {moTerms.GetXPerColumn(), moTerms.GetYPerColumn(), moTerms.GetXPerRow(), moTerms.GetYPerRow()};
}

} // namespace krv::gobs
