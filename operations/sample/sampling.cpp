#include "operations/sample/sampling.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"
#include "operations/job/exceptions.h"
#include "operations/source/referencesystem.h"
#include "operations/source/sourcefile.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <memory>
#include <numeric>

namespace krv::operations
{

using krv::gobs::SampleValue;
using krv::ogc::cs::CoordinateTransformation;
using krv::ogc::cs::ICRS;

namespace
{

constexpr int GEOGRAPHIC = 4326;

// From coordinates as they are given to columns and rows; false for a point that is nowhere on the image.
using Placer = std::function<bool(double& nX, double& nY)>;

Placer PlaceIn(const ImagePlace& oPlace)
{
    return [oPlace](double& nX, double& nY)
    {
        double nColumn = 0, nRow = 0;
        const bool bFound = oPlace.ToRaster(nX, nY, nColumn, nRow);
        nX = nColumn;
        nY = nRow;
        return bFound;
    };
}

// Brings points to the system of the image first, unless it is the one that they are in.
Placer Between(const ICRS& oFrom, const ICRS& oTo, Placer oPlacer)
{
    if (oFrom.IsEquivalent(oTo))
        return oPlacer;
    return [poMove = std::make_shared<CoordinateTransformation>(oFrom, oTo), oPlacer](double& nX, double& nY)
    {
        return poMove->Transform(nX, nY) && oPlacer(nX, nY);
    };
}

Placer MakePlacer(const SourceFile& oFile, const SampleRequest& oRequest, SampleResult& oResult)
{
    const bool bNamed =
        oRequest.coordinates == PointCoordinates::eGeographic || oRequest.coordinates == PointCoordinates::eNamedMap;
    const auto oPlace = oRequest.coordinates != PointCoordinates::ePixels
                            ? ImagePlace::Find(oFile, oRequest.height, !bNamed)
                            : std::nullopt;
    oResult.coordinates = oRequest.coordinates;
    if (oRequest.coordinates == PointCoordinates::eAsPlaced)
        oResult.coordinates = oPlace ? PointCoordinates::eMap : PointCoordinates::ePixels;
    if (oResult.coordinates == PointCoordinates::ePixels)
        return [](double&, double&)
        {
            return true;
        };
    if (!oPlace)
        throw RequestException(oFile.GetName() + ": the file does not say where it lies; give the points in pixels",
                               "coordinates");
    oResult.placedBy = oPlace->GetKind();
    if (!bNamed)
        return PlaceIn(*oPlace);
    if (oPlace->GetCRS() == nullptr)
        throw RequestException(oFile.GetName() + ": it names no reference system; give map coordinates or pixels");
    const bool bGeographic = oRequest.coordinates == PointCoordinates::eGeographic;
    return Between(*(bGeographic ? krv::ogc::cs::CreateCRSFromEPSG(GEOGRAPHIC) : ParseReferenceSystem(oRequest.crs)),
                   *oPlace->GetCRS(), PlaceIn(*oPlace));
}

// Channels of one type: what reads them, and what says which pixels are valid beside the values of their channels.
struct Group
{
    LevelReader reader;
    std::unique_ptr<const krv::datasources::ValiditySource> validity;
    const ChannelGroup* channels;
    std::vector<OptionalNoData> noData; // of each
    std::vector<ValueScale> scales;
};

template <class Number>
SampleValue ToValue(Number nNumber)
{
    if constexpr (std::is_floating_point_v<Number>)
        return SampleValue::FromReal(static_cast<double>(nNumber));
    else if constexpr (std::is_signed_v<Number>)
        return SampleValue::FromSigned(nNumber);
    else
        return SampleValue::FromUnsigned(nNumber);
}

template <class Number>
void Take(const unsigned char* pBytes, bool bComplex, const OptionalNoData& oNoData, SampledValue& oValue)
{
    const auto* const pParts = reinterpret_cast<const Number*>(pBytes);
    const krv::gobs::SampleMatch<Number> oMatch(oNoData);
    oValue.real = ToValue(pParts[0]);
    bool bNoData = false;
    if (bComplex)
    {
        oValue.imaginary = ToValue(pParts[1]);
        bNoData = oMatch.Matches(pParts[0], pParts[1]);
    }
    else
        bNoData = oMatch.Matches(pParts[0]);
    oValue.state = bNoData ? SampleState::eNoData : SampleState::eValid;
}

void ReadPixel(const Group& oGroup, SampledPoint& oPoint)
{
    const std::unique_ptr<krv::gobs::Raster> poPixel(oGroup.reader.Get().ReadRaster(
        static_cast<unsigned int>(oPoint.column), static_cast<unsigned int>(oPoint.row), 1, 1));
    const krv::gobs::DataType& oType = poPixel->GetDataType();
    const std::unique_ptr<const krv::gobs::Mask> poValid(oGroup.validity->BuildMask(*poPixel));
    const bool bMasked = !poValid->GetBit(0, 0);
    for (std::size_t c = 0; c < oGroup.channels->channels.size(); ++c)
    {
        SampledValue& oValue = oPoint.values[oGroup.channels->positions[c]];
        const unsigned char* const pBytes = poPixel->GetBuffer() + c * (oType.GetValueBits() / 8);
        krv::gobs::VisitPartType(oType, [&]<class Part>(std::type_identity<Part>)
                                 { Take<Part>(pBytes, oType.IsComplex(), oGroup.noData[c], oValue); });
        if (bMasked && oValue.state == SampleState::eValid)
            oValue.state = SampleState::eMasked;
        oValue.scaled = oGroup.scales[c](oValue.real.GetReal());
    }
}

// The points on the image, row of blocks by row of blocks.
std::vector<std::size_t> OrderOf(const std::vector<SampledPoint>& oPoints, const krv::datasources::IRasterReader& oGrid)
{
    std::vector<std::size_t> oOrder;
    for (std::size_t i = 0; i < oPoints.size(); ++i)
    {
        const SampledPoint& oPoint = oPoints[i];
        if (oPoint.column >= 0 && oPoint.row >= 0 && oPoint.column < oGrid.GetWidth() && oPoint.row < oGrid.GetHeight())
            oOrder.push_back(i);
    }
    const auto BlockOf = [&](std::size_t i)
    {
        return std::pair(std::floor(oPoints[i].row / oGrid.GetTileHeight()),
                         std::floor(oPoints[i].column / oGrid.GetTileWidth()));
    };
    std::stable_sort(oOrder.begin(), oOrder.end(),
                     [&](std::size_t nOne, std::size_t nOther) { return BlockOf(nOne) < BlockOf(nOther); });
    return oOrder;
}

} // namespace

SampleResult SampleValues(const SourceFile& oFile, const SampleRequest& oRequest, const Progress& oProgress)
{
    const auto oChannels = oFile.CheckChannels(oRequest.channels);
    SampleResult oResult;
    for (const unsigned int nChannel : oChannels)
        oResult.channels.push_back({nChannel, oFile.GetType(nChannel)});
    const Placer oPlacer = MakePlacer(oFile, oRequest, oResult);
    for (const SamplePoint& oPoint : oRequest.points)
    {
        double nX = oPoint.x, nY = oPoint.y;
        if (!oPlacer(nX, nY))
            nX = nY = std::numeric_limits<double>::quiet_NaN();
        oResult.points.push_back({nX, nY, std::vector<SampledValue>(oChannels.size())});
    }
    const std::vector<ChannelGroup> oByType = oFile.GroupByType(oChannels);
    std::vector<Group> oGroups;
    oGroups.reserve(oByType.size());
    for (const ChannelGroup& oGroup : oByType)
    {
        Group& oNew = oGroups.emplace_back(
            Group{oFile.Read(oGroup.channels), oFile.MakeValidity(oGroup.channels), &oGroup, {}, {}});
        for (const unsigned int nChannel : oGroup.channels)
        {
            oNew.noData.push_back(oFile.GetNoData(nChannel));
            oNew.scales.push_back(oFile.GetScale(nChannel));
        }
    }
    const auto oOrder = OrderOf(oResult.points, oGroups.front().reader.Get());
    ProgressCounter oCounter(oProgress, "sample", oOrder.size() * oChannels.size());
    for (const std::size_t nPoint : oOrder)
    {
        for (const Group& oGroup : oGroups)
            ReadPixel(oGroup, oResult.points[nPoint]);
        oCounter.Advance(oChannels.size());
    }
    return oResult;
}

} // namespace krv::operations
