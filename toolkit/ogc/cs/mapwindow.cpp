#include "toolkit/ogc/cs/mapwindow.h"

#include "toolkit/ogc/cs/geocodinginfo.h"

#include <algorithm>
#include <cmath>

namespace krv::ogc::cs
{

MapBounds OutlineOf(const GeocodingInfo& oInfo, double nWidth, double nHeight)
{
    MapBounds oBounds{HUGE_VAL, HUGE_VAL, -HUGE_VAL, -HUGE_VAL};
    for (const double nColumn : {0.0, nWidth})
    {
        for (const double nRow : {0.0, nHeight})
        {
            double nX = 0, nY = 0;
            oInfo.RasterToMap(nColumn, nRow, nX, nY);
            oBounds = {std::min(oBounds.west, nX), std::min(oBounds.south, nY), std::max(oBounds.east, nX),
                       std::max(oBounds.north, nY)};
        }
    }
    return oBounds;
}

std::optional<PixelWindow> WindowOf(const GeocodingInfo& oInfo, unsigned int nWidth, unsigned int nHeight,
                                    const MapBounds& oBounds)
{
    double nLeft = HUGE_VAL, nTop = HUGE_VAL, nRight = -HUGE_VAL, nBottom = -HUGE_VAL;
    for (const double nX : {oBounds.west, oBounds.east})
    {
        for (const double nY : {oBounds.south, oBounds.north})
        {
            double nColumn = 0, nRow = 0;
            if (!oInfo.MapToRaster(nX, nY, nColumn, nRow))
                return std::nullopt;
            nLeft = std::min(nLeft, nColumn);
            nRight = std::max(nRight, nColumn);
            nTop = std::min(nTop, nRow);
            nBottom = std::max(nBottom, nRow);
        }
    }
    constexpr double ASIDE = 1e-6;
    const auto Begin = [](double n)
    {
        return std::max(0.0, std::floor(n + ASIDE));
    };
    const auto End = [](double n, unsigned int nSize)
    {
        return std::min<double>(nSize, std::ceil(n - ASIDE));
    };
    const double nX = Begin(nLeft), nY = Begin(nTop);
    const double nColumns = End(nRight, nWidth) - nX, nRows = End(nBottom, nHeight) - nY;
    if (!(nColumns >= 1) || !(nRows >= 1))
        return std::nullopt;
    return PixelWindow{static_cast<unsigned int>(nX), static_cast<unsigned int>(nY),
                       static_cast<unsigned int>(nColumns), static_cast<unsigned int>(nRows)};
}

} // namespace krv::ogc::cs
