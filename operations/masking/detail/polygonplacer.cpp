#include "operations/masking/detail/polygonplacer.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "operations/job/exceptions.h"
#include "operations/source/referencesystem.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <numbers>
#include <string>
#include <utility>

namespace krv::operations::detail
{

namespace
{

constexpr double MARGIN = 0.05;        // of the longer side of the surroundings
constexpr double TOLERANCE = 0.05;     // pixels between an edge and its straight pieces
constexpr double LONG_EDGE = 64;       // pixels; such an edge may swing to both sides and meet its chord in the middle
constexpr unsigned int LONG_DEPTH = 4; // so it is split this often without a look at its middle
constexpr unsigned int DEEPEST = 20;
constexpr std::size_t MOST_ADDED = 8'000'000; // vertices
constexpr unsigned int GRID = 32;

double TurnOf(const krv::ogc::cs::ICRS& oSystem)
{
    // Definitions write the degree with some 15 digits; the rounding brings the 360 back.
    return oSystem.IsGeographic() ? std::round(2e9 * std::numbers::pi / oSystem.GetUnitFactor()) / 1e9 : 0;
}

// The same longitude at most half a turn from another.
double BringNear(double nX, double nCentre, double nTurn)
{
    return nTurn > 0 && std::abs(nX - nCentre) > nTurn / 2 ? nCentre + std::remainder(nX - nCentre, nTurn) : nX;
}

GDBVertex MiddleOf(const GDBVertex& a, const GDBVertex& b)
{
    return {a.x / 2 + b.x / 2, a.y / 2 + b.y / 2};
}

double DistanceToSegment(const GDBVertex& oPoint, const GDBVertex& a, const GDBVertex& b)
{
    const double nX = b.x - a.x, nY = b.y - a.y, nSquare = nX * nX + nY * nY;
    const double nAlong = ((oPoint.x - a.x) * nX + (oPoint.y - a.y) * nY) / nSquare;
    const double nAt = nSquare > 0 ? std::clamp(nAlong, 0.0, 1.0) : 0;
    return std::hypot(oPoint.x - a.x - nAt * nX, oPoint.y - a.y - nAt * nY);
}

} // namespace

PolygonPlacer::PolygonPlacer(const SourceFile& oFile, const MaskRequest& oRequest, const PolygonText& oText)
    : moFile(oFile)
{
    PolygonCoordinates eMeaning = oRequest.coordinates;
    std::string crs = oRequest.crs;
    if (eMeaning == PolygonCoordinates::eAsWritten && (oText.geographic || !oText.crs.empty()))
    {
        eMeaning = PolygonCoordinates::eNamedMap;
        crs = oText.crs.empty() ? "EPSG:4326" : oText.crs;
    }
    if (!oText.crs.empty() && eMeaning == PolygonCoordinates::eMap)
        throw RequestException("map coordinates are those of the file's own reference system, but the polygon names " +
                                   oText.crs + "; leave one of them out",
                               "coordinates");
    if (!oText.crs.empty() && eMeaning == PolygonCoordinates::ePixels)
        throw RequestException("pixels have no reference system, but the polygon names " + oText.crs +
                                   "; leave one of them out",
                               "coordinates");
    if (eMeaning == PolygonCoordinates::ePixels)
        return;
    const auto* const poGeocoded = dynamic_cast<krv::datasources::IGeocodedDataset*>(&oFile.GetDataset());
    if (poGeocoded == nullptr || poGeocoded->GetGeocoding().IsIdentity() || !poGeocoded->GetGeocoding().IsInvertible())
        throw RequestException(oFile.GetName() + ": the file is not georeferenced; give polygons in pixels",
                               "coordinates");
    moGeocoding = poGeocoded->GetGeocoding();
    if (eMeaning != PolygonCoordinates::eNamedMap)
        return;
    const std::unique_ptr<krv::ogc::cs::ICRS> poTarget(oFile.GetDataset().ReadCRS());
    if (poTarget == nullptr)
        throw RequestException(oFile.GetName() +
                                   ": the file names no reference system; give polygons in its own map units",
                               "coordinates");
    const auto poSource = ParseReferenceSystem(crs);
    moTransformation.emplace(*poSource, *poTarget);
    mnSourceTurn = TurnOf(*poSource);
    mnTargetTurn = TurnOf(*poTarget);
    FindSurroundings();
}

// The part of the polygons' system that the image covers, and a margin. None when it cannot be told: a part of the
// image has no place in that system, or it does not lie there in one piece, as around a pole.
void PolygonPlacer::FindSurroundings()
{
    const double nWidth = moFile.GetRaster().GetWidth(), nHeight = moFile.GetRaster().GetHeight();
    double nUnused = 0;
    moGeocoding->RasterToMap(nWidth / 2, nHeight / 2, mnTargetCentre, nUnused);
    constexpr std::size_t SIDE = GRID + 1;
    std::vector<double> oPlaces[2];
    for (std::size_t i = 0; i < SIDE * SIDE; ++i)
    {
        double nX = 0, nY = 0;
        moGeocoding->RasterToMap(nWidth * static_cast<double>(i % SIDE) / GRID,
                                 nHeight * static_cast<double>(i / SIDE) / GRID, nX, nY);
        oPlaces[0].push_back(nX);
        oPlaces[1].push_back(nY);
    }
    if (moTransformation->TransformBack(SIDE * SIDE, oPlaces[0].data(), oPlaces[1].data()) != SIDE * SIDE)
        return;
    const double nCentre = oPlaces[0][SIDE * SIDE / 2];
    for (double& nX : oPlaces[0])
        nX = BringNear(nX, nCentre, mnSourceTurn);
    Box oBox{};
    double nMargin = 0;
    for (int nAxis = 0; nAxis < 2; ++nAxis)
    {
        const std::vector<double>& oAxis = oPlaces[nAxis];
        const auto [pLow, pHigh] = std::minmax_element(oAxis.begin(), oAxis.end());
        oBox.low[nAxis] = *pLow;
        oBox.high[nAxis] = *pHigh;
        nMargin = std::max(nMargin, MARGIN * (*pHigh - *pLow));
    }
    for (const std::vector<double>& oAxis : oPlaces)
        for (std::size_t i = 0; i < SIDE * SIDE; ++i)
        {
            // Neighbours that lie several times the margin apart belong to a tear.
            const double nRight = i % SIDE < GRID ? std::abs(oAxis[i + 1] - oAxis[i]) : 0;
            const double nBelow = i / SIDE < GRID ? std::abs(oAxis[i + SIDE] - oAxis[i]) : 0;
            if (std::max(nRight, nBelow) > 5 * nMargin)
                return;
        }
    for (int nAxis = 0; nAxis < 2; ++nAxis)
    {
        oBox.low[nAxis] -= nMargin;
        oBox.high[nAxis] += nMargin;
    }
    if (mnSourceTurn > 0 && oBox.high[0] - oBox.low[0] > mnSourceTurn)
    {
        oBox.low[0] = nCentre - mnSourceTurn / 2;
        oBox.high[0] = nCentre + mnSourceTurn / 2;
    }
    moSurroundings = oBox;
}

// Clipping would hide that somebody gave latitudes first.
void PolygonPlacer::CheckLatitudes(const Ring& oRing) const
{
    for (const GDBVertex& oVertex : oRing)
        if (mnSourceTurn > 0 && std::abs(oVertex.y) > mnSourceTurn / 4 * (1 + 1e-9))
            throw krv::DataException(fmt::format("{}: the vertex {} {} cannot be taken to the file's reference system; "
                                                 "is the order x y?",
                                                 moFile.GetName(), oVertex.x, oVertex.y));
}

// Leaves what lies on the side where nSign * (coordinate - limit) >= 0.
void PolygonPlacer::ClipSide(Ring& oRing, double GDBVertex::*pAxis, double nLimit, double nSign)
{
    Ring oResult;
    for (std::size_t i = 0; i < oRing.size(); ++i)
    {
        const GDBVertex& oFrom = oRing[i == 0 ? oRing.size() - 1 : i - 1];
        const GDBVertex& oTo = oRing[i];
        const bool bFrom = nSign * (oFrom.*pAxis - nLimit) >= 0, bTo = nSign * (oTo.*pAxis - nLimit) >= 0;
        if (bFrom != bTo)
        {
            const double nAt = (nLimit - oFrom.*pAxis) / (oTo.*pAxis - oFrom.*pAxis);
            GDBVertex oCut{oFrom.x + nAt * (oTo.x - oFrom.x), oFrom.y + nAt * (oTo.y - oFrom.y)};
            oCut.*pAxis = nLimit;
            oResult.push_back(oCut);
        }
        if (bTo)
            oResult.push_back(oTo);
    }
    oRing.swap(oResult);
}

PolygonPlacer::Ring PolygonPlacer::Clip(Ring oRing, double nShift) const
{
    for (GDBVertex& oVertex : oRing)
        oVertex.x += nShift;
    ClipSide(oRing, &GDBVertex::x, moSurroundings->low[0], 1);
    ClipSide(oRing, &GDBVertex::x, moSurroundings->high[0], -1);
    ClipSide(oRing, &GDBVertex::y, moSurroundings->low[1], 1);
    ClipSide(oRing, &GDBVertex::y, moSurroundings->high[1], -1);
    // A neighbour a turn away that only touches would be drawn as a line.
    if (nShift != 0 && std::all_of(oRing.begin(), oRing.end(),
                                   [&oRing](const GDBVertex& oVertex) { return oVertex.x == oRing.front().x; }))
        oRing.clear();
    return oRing;
}

GDBVertex PolygonPlacer::ToPixel(const GDBVertex& oVertex) const
{
    double nX = oVertex.x, nY = oVertex.y;
    if (!moTransformation->Transform(nX, nY))
        throw krv::DataException(fmt::format("{}: {} {} cannot be taken to the file's reference system; is the order "
                                             "x y?",
                                             moFile.GetName(), oVertex.x, oVertex.y));
    GDBVertex oPixel{};
    moGeocoding->MapToRaster(BringNear(nX, mnTargetCentre, mnTargetTurn), nY, oPixel.x, oPixel.y);
    return oPixel;
}

// Adds what lies between the ends of an edge.
void PolygonPlacer::Split(const GDBVertex& oFrom, const GDBVertex& oTo, const GDBVertex& oPixelFrom,
                          const GDBVertex& oPixelTo, unsigned int nDepth, Ring& oResult)
{
    if (nDepth == DEEPEST || mnAdded == MOST_ADDED)
        return;
    const GDBVertex oMiddle = MiddleOf(oFrom, oTo), oPixel = ToPixel(oMiddle);
    const bool bLong =
        nDepth < LONG_DEPTH && std::hypot(oPixelTo.x - oPixelFrom.x, oPixelTo.y - oPixelFrom.y) > LONG_EDGE;
    if (!bLong && DistanceToSegment(oPixel, oPixelFrom, oPixelTo) <= TOLERANCE)
        return;
    if (++mnAdded == MOST_ADDED)
        krv::nspio::Warning::Warn(
            "the polygons have too many long edges; from some on they are not bent as they should be");
    Split(oFrom, oMiddle, oPixelFrom, oPixel, nDepth + 1, oResult);
    oResult.push_back(oPixel);
    Split(oMiddle, oTo, oPixel, oPixelTo, nDepth + 1, oResult);
}

PolygonPlacer::Ring PolygonPlacer::Project(const Ring& oRing)
{
    Ring oCorners, oResult;
    for (const GDBVertex& oVertex : oRing)
        oCorners.push_back(ToPixel(oVertex));
    for (std::size_t i = 0; i < oRing.size(); ++i)
    {
        const std::size_t nNext = i + 1 == oRing.size() ? 0 : i + 1;
        oResult.push_back(oCorners[i]);
        Split(oRing[i], oRing[nNext], oCorners[i], oCorners[nNext], 0, oResult);
    }
    return oResult;
}

std::vector<GGLShape> PolygonPlacer::Place(const std::vector<Ring>& oRings)
{
    std::vector<GGLShape> oResult;
    if (!moTransformation)
    {
        GGLShape& oShape = oResult.emplace_back();
        for (Ring oRing : oRings)
        {
            for (GDBVertex& oVertex : oRing)
                if (moGeocoding)
                    moGeocoding->MapToRaster(oVertex.x, oVertex.y, oVertex.x, oVertex.y);
            oShape.AddRing(oRing);
        }
        return oResult;
    }
    for (const Ring& oRing : oRings)
        CheckLatitudes(oRing);
    const int nTurns = moSurroundings && mnSourceTurn > 0 ? 1 : 0;
    for (int nTurn = -nTurns; nTurn <= nTurns; ++nTurn)
    {
        GGLShape oShape;
        for (const Ring& oRing : oRings)
        {
            const Ring oPlaced = Project(moSurroundings ? Clip(oRing, nTurn * mnSourceTurn) : oRing);
            if (!oPlaced.empty())
                oShape.AddRing(oPlaced);
        }
        if (!oShape.GetVertices().empty())
            oResult.push_back(std::move(oShape));
    }
    return oResult;
}

} // namespace krv::operations::detail
