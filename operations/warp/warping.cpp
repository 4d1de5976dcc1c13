#include "operations/warp/warping.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/findpct.h"
#include "datasources/reader/derived/transformrasterreader.h"
#include "datasources/reader/validitysource.h"
#include "gobs/pct/pct.h"
#include "gobs/resampling/gridmap.h"
#include "operations/copy/detail/storereader.h"
#include "operations/copy/detail/target.h"
#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/controlpoints.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <memory>

namespace krv::operations
{

using namespace krv::datasources;
using krv::gobs::AffineMap;
using krv::gobs::IGridMap;
using krv::gobs::Resampling;
using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::PolynomialFit;

namespace
{

struct Grid
{
    GeocodingInfo geocoding;
    unsigned int width = 0;
    unsigned int height = 0;
};

// From pixels of a grid to those of an image that control points place.
class ControlPointMap : public IGridMap
{
public:
    ControlPointMap(const Grid& oGrid, PolynomialFit oFit) : moGrid(oGrid), moFit(std::move(oFit)) {}

    void MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const override
    {
        for (std::size_t n = 0; n < nCount; ++n)
            Map(static_cast<double>(nX) + static_cast<double>(n) + 0.5, static_cast<double>(nY) + 0.5, pX[n], pY[n]);
    }
    std::array<double, 4> GetFootprint(double nX, double nY) const override
    {
        double aX[4] = {}, aY[4] = {};
        Map(nX - 0.5, nY, aX[0], aY[0]);
        Map(nX + 0.5, nY, aX[1], aY[1]);
        Map(nX, nY - 0.5, aX[2], aY[2]);
        Map(nX, nY + 0.5, aX[3], aY[3]);
        return {aX[1] - aX[0], aY[1] - aY[0], aX[3] - aX[2], aY[3] - aY[2]};
    }

private:
    void Map(double nColumn, double nRow, double& nX, double& nY) const
    {
        double nMapX = 0, nMapY = 0;
        moGrid.geocoding.RasterToMap(nColumn, nRow, nMapX, nMapY);
        moFit.Map(nMapX, nMapY, nX, nY);
    }

    Grid moGrid;
    PolynomialFit moFit;
};

// Where the image lies: its own transform, or the one that fits its control points best.
struct Placement
{
    GeocodingInfo geocoding;
    std::vector<krv::ogc::cs::ControlPoint> points;
};

Placement Place(const SourceFile& oFile)
{
    const auto* const poGeocoded = dynamic_cast<const IGeocodedDataset*>(&oFile.GetDataset());
    Placement oPlacement;
    if (poGeocoded != nullptr)
        oPlacement.geocoding = poGeocoded->GetGeocoding();
    if (!oPlacement.geocoding.IsIdentity())
        return oPlacement;
    oPlacement.points =
        krv::ogc::cs::ParseControlPoints(oFile.GetMetadata().GetFileMetadataValue("GroundControlPoints"));
    if (oPlacement.points.size() < 3)
        oPlacement.points.clear();
    else
        oPlacement.geocoding = PolynomialFit(oPlacement.points, 1, PolynomialFit::eRasterToMap).GetAffine();
    return oPlacement;
}

unsigned int PixelsIn(double nLength, double nStep)
{
    constexpr double ASIDE = 1e-6;
    const double nPixels = std::max(1.0, std::ceil(nLength / nStep - ASIDE));
    if (!(nPixels <= 2147483647.0))
        throw RequestException(
            fmt::format("a grid of {} map units in steps of {} has too many pixels", nLength, nStep));
    return static_cast<unsigned int>(nPixels);
}

Grid GridLike(const SourceFile& oFile, const std::string& like)
{
    const SourceFile oOther(like);
    CheckSameSystem(oFile, oOther);
    return {RequireGeocoding(oOther), oOther.GetRaster().GetWidth(), oOther.GetRaster().GetHeight()};
}

// North is up, as it is in the file; pixels of images that lie nowhere count downwards.
Grid MakeGrid(const WarpRequest& oRequest, const SourceFile& oFile, const GeocodingInfo& oPlace)
{
    const MapBounds oBounds =
        oRequest.bounds.value_or(OutlineOf(oPlace, oFile.GetRaster().GetWidth(), oFile.GetRaster().GetHeight()));
    const double nWidth = oBounds.east - oBounds.west, nHeight = oBounds.north - oBounds.south;
    double nColumn = oPlace.GetColumnSpacing(), nRow = oPlace.GetRowSpacing();
    Grid oGrid;
    if (!oRequest.size.empty())
    {
        oGrid.width = oRequest.size.front();
        oGrid.height = oRequest.size.back();
        nColumn = nWidth / oGrid.width;
        nRow = nHeight / oGrid.height;
    }
    else
    {
        if (!oRequest.resolution.empty())
        {
            nColumn = oRequest.resolution.front();
            nRow = oRequest.resolution.back();
        }
        oGrid.width = PixelsIn(nWidth, nColumn);
        oGrid.height = PixelsIn(nHeight, nRow);
    }
    const bool bDown = oPlace.IsRotated() || oPlace.GetYPerRow() < 0;
    oGrid.geocoding = {oBounds.west, nColumn, 0, bDown ? oBounds.north : oBounds.south, 0, bDown ? -nRow : nRow};
    return oGrid;
}

void WarnOfMiss(const SourceFile& oFile, const GeocodingInfo& oPlace, const Grid& oGrid)
{
    const MapBounds oImage = OutlineOf(oPlace, oFile.GetRaster().GetWidth(), oFile.GetRaster().GetHeight());
    const MapBounds oWanted = OutlineOf(oGrid.geocoding, oGrid.width, oGrid.height);
    if (oWanted.west >= oImage.east || oWanted.east <= oImage.west || oWanted.south >= oImage.north ||
        oWanted.north <= oImage.south)
        detail::Target::Warn(oFile.GetName() + ": the grid lies outside of the image; no pixel has a source");
}

// Reals have "nan" for what the mask of a channel alone takes away, a file with a no-data value has that.
void WarnOfChannelMasks(const SourceFile& oFile, const std::vector<unsigned int>& oChannels)
{
    const auto poValidity = oFile.MakeValidity(oChannels);
    const bool bInteger = std::any_of(oChannels.begin(), oChannels.end(),
                                      [&](unsigned int nChannel) { return !oFile.GetType(nChannel).IsReal(); });
    if (oChannels.size() > 1 && bInteger && poValidity->HasChannelMasks() && !poValidity->HasNoData())
        detail::Target::Warn(oFile.GetName() +
                             ": where the mask of a channel alone takes its pixels away they become 0, "
                             "which is not marked; a no-data value would mark them");
}

void CheckRequest(const WarpRequest& oRequest)
{
    const auto IsStep = [](double n)
    {
        return n > 0;
    };
    if (!std::all_of(oRequest.resolution.begin(), oRequest.resolution.end(), IsStep))
        throw RequestException("a resolution is above 0");
    if (std::find(oRequest.size.begin(), oRequest.size.end(), 0U) != oRequest.size.end())
        throw RequestException("a size is above 0");
    if (!oRequest.size.empty() && !oRequest.resolution.empty())
        throw RequestException("a grid is given by its size or by its resolution, not by both");
    const bool bOwn = oRequest.bounds || !oRequest.size.empty() || !oRequest.resolution.empty();
    if (!oRequest.like.empty() && bOwn)
        throw RequestException("the grid of another file is taken as it is, without bounds, resolution and size");
}

// A reader and what it stands on.
struct GridReader
{
    GridReader(LevelReader oSource, const std::shared_ptr<const IGridMap>& poMap, const TransformRequest& oRequest)
        : source(std::move(oSource)), reader(&source.Get(), poMap, oRequest, false)
    {
    }

    LevelReader source;
    TransformRasterReader reader;
};

void KeepTable(const krv::gobs::PCT& oTable, const detail::Target& oTarget)
{
    auto* const poTables = oTarget.Find<IPCTDataset>();
    if (poTables == nullptr)
        return detail::Target::Warn(oTarget.GetName() + ": the colour table is not kept: the format has none");
    oTarget.Try("the colour table", [&] { poTables->CreatePCT(oTable, 1); });
}

} // namespace

WarpResult Warp(const WarpRequest& oRequest, const TargetForm& oForm, const Progress& oProgress,
                krv::threading::IExecutor* poExecutor)
{
    CheckRequest(oRequest);
    detail::CheckTarget({oRequest.source, oRequest.like}, oForm.name);
    const SourceFile oFile(oRequest.source);
    const auto oChannels = oFile.CheckChannels(oRequest.channels);
    const Placement oPlacement = Place(oFile);
    const Grid oGrid =
        oRequest.like.empty() ? MakeGrid(oRequest, oFile, oPlacement.geocoding) : GridLike(oFile, oRequest.like);
    WarnOfMiss(oFile, oPlacement.geocoding, oGrid);
    if (!oRequest.noData)
        WarnOfChannelMasks(oFile, oChannels);
    WarpResult oResult{oGrid.width, oGrid.height, oGrid.geocoding};
    const std::unique_ptr<krv::gobs::PCT> poTable =
        oChannels.size() == 1 ? FindPCT(oFile.GetDataset(), oChannels.front()) : nullptr;
    oResult.method = oRequest.method.value_or(poTable != nullptr ? Resampling::eMode : Resampling::eBilinear);
    const bool bTaken = oResult.method == Resampling::eNearest || oResult.method == Resampling::eMode;
    if (poTable != nullptr && !bTaken)
        throw RequestException(oFile.GetName() +
                                   ": its pixels are indices of a colour table; only the methods mode and nearest fit",
                               "method");

    TransformRequest oTransform{oGrid.width, oGrid.height, oResult.method};
    oTransform.mbExact = oRequest.exact;
    oTransform.moGeocoding = oGrid.geocoding;
    if (oRequest.noData)
        oTransform.moBackground = {*oRequest.noData};
    std::shared_ptr<const IGridMap> poMap;
    if (oPlacement.points.empty())
        poMap = std::make_shared<AffineMap>(oGrid.geocoding, oPlacement.geocoding);
    else
    {
        oResult.points = oPlacement.points.size();
        oResult.degree = oRequest.degree != 0 ? oRequest.degree : PolynomialFit::GetUsualDegree(oResult.points);
        PolynomialFit oFit(oPlacement.points, oResult.degree, PolynomialFit::eMapToRaster);
        oResult.residual = oFit.GetResidual();
        oResult.largestResidual = oFit.GetLargestResidual();
        poMap = std::make_shared<ControlPointMap>(oGrid, std::move(oFit));
    }
    std::vector<krv::gobs::DataType> oTypes;
    for (const unsigned int nChannel : oChannels)
        oTypes.push_back(oFile.GetType(nChannel));
    // Types are never promoted on the way: some promotions lose values.
    std::vector<detail::StoredChannels> oStored;
    for (const ChannelGroup& oGroup : oFile.GroupByType(oChannels))
    {
        const auto Open = [&, oGroup](const SourceFile& oOpened)
        {
            const auto poGridReader = std::make_shared<GridReader>(oOpened.Read(oGroup.channels), poMap, oTransform);
            return std::shared_ptr<IRasterReader>(poGridReader, &poGridReader->reader);
        };
        oStored.push_back({Open, {}});
        for (const std::size_t nPosition : oGroup.positions)
            oStored.back().channels.push_back(static_cast<unsigned int>(nPosition) + 1);
    }
    const detail::Target oTarget(detail::TargetLayout{oGrid.width, oGrid.height, oTypes}, oForm, oProgress, poExecutor);
    if (poTable != nullptr)
        KeepTable(*poTable, oTarget);
    detail::StoreReaders(oFile, oStored, {0, 0, oGrid.width, oGrid.height}, oTarget, "warp");
    return oResult;
}

} // namespace krv::operations
