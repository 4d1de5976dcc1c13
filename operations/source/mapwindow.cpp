#include "operations/source/mapwindow.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/ogc/cs/icrs.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <memory>

namespace krv::operations
{

using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::ICRS;

GeocodingInfo RequireGeocoding(const SourceFile& oFile)
{
    const auto* const poGeocoded = dynamic_cast<const krv::datasources::IGeocodedDataset*>(&oFile.GetDataset());
    if (poGeocoded == nullptr || poGeocoded->GetGeocoding().IsIdentity())
        throw RequestException(oFile.GetName() + ": it does not say where it lies; give the window in pixels");
    if (!poGeocoded->GetGeocoding().IsInvertible())
        throw RequestException(oFile.GetName() + ": its transform to map coordinates has no inverse");
    return poGeocoded->GetGeocoding();
}

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

void CheckSameSystem(const SourceFile& oFile, const SourceFile& oOther)
{
    const std::unique_ptr<ICRS> poOne(oFile.GetDataset().ReadCRS()), poOther(oOther.GetDataset().ReadCRS());
    if (poOne != nullptr && poOther != nullptr && !poOne->IsEquivalent(*poOther))
        throw RequestException(fmt::format("{}: it is in {}, {} in {}; only files of one reference system fit together",
                                           oOther.GetName(), poOther->GetName(), oFile.GetName(), poOne->GetName()));
}

MapBounds BoundsLike(const SourceFile& oFile, const SourceFile& oOther)
{
    CheckSameSystem(oFile, oOther);
    return OutlineOf(RequireGeocoding(oOther), oOther.GetRaster().GetWidth(), oOther.GetRaster().GetHeight());
}

namespace
{

PixelWindow WindowOf(const SourceFile& oFile, const MapBounds& oBounds)
{
    const GeocodingInfo oInfo = RequireGeocoding(oFile);
    double nLeft = HUGE_VAL, nTop = HUGE_VAL, nRight = -HUGE_VAL, nBottom = -HUGE_VAL;
    for (const double nX : {oBounds.west, oBounds.east})
    {
        for (const double nY : {oBounds.south, oBounds.north})
        {
            double nColumn = 0, nRow = 0;
            oInfo.MapToRaster(nX, nY, nColumn, nRow);
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
    const double nWidth = End(nRight, oFile.GetRaster().GetWidth()) - nX;
    const double nHeight = End(nBottom, oFile.GetRaster().GetHeight()) - nY;
    if (!(nWidth >= 1) || !(nHeight >= 1))
        throw RequestException(fmt::format("{}: the bounds {}, {}, {}, {} hold none of its pixels", oFile.GetName(),
                                           oBounds.west, oBounds.south, oBounds.east, oBounds.north));
    return {static_cast<unsigned int>(nX), static_cast<unsigned int>(nY), static_cast<unsigned int>(nWidth),
            static_cast<unsigned int>(nHeight)};
}

} // namespace

std::optional<PixelWindow> FindWindow(const SourceFile& oFile, const WindowRequest& oRequest)
{
    if (oRequest.bounds)
        return WindowOf(oFile, *oRequest.bounds);
    if (!oRequest.like.empty())
        return WindowOf(oFile, BoundsLike(oFile, SourceFile(oRequest.like)));
    return oRequest.pixels;
}

} // namespace krv::operations
