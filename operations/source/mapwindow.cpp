#include "operations/source/mapwindow.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/ogc/cs/icrs.h"

#include <fmt/format.h>

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
    const auto oWindow = krv::ogc::cs::WindowOf(RequireGeocoding(oFile), oFile.GetRaster().GetWidth(),
                                                oFile.GetRaster().GetHeight(), oBounds);
    if (!oWindow)
        throw RequestException(fmt::format("{}: the bounds {}, {}, {}, {} hold none of its pixels", oFile.GetName(),
                                           oBounds.west, oBounds.south, oBounds.east, oBounds.north));
    return *oWindow;
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
