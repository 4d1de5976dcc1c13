#include "plugins/support/geotiff/geotags.h"

#include "plugins/support/geotiff/geokeylist.h"
#include "plugins/support/geotiff/keyproposals.h"
#include "toolkit/exceptions/exceptions.h"

#include <cmath>
#include <cstddef>
#include <utility>

#include <geokeys.h>
#include <geovalues.h>

namespace krv::plugins::support
{

namespace
{

using krv::ogc::cs::GeocodingInfo;

constexpr std::size_t MATRIX_VALUES = 16;   // four rows of four
constexpr std::size_t TIE_POINT_VALUES = 6; // column, row, level, x, y, z
constexpr double HALF_PIXEL = 0.5;

bool ReadMatrix(const GeoTags& oTags, GeocodingInfo& oInfo)
{
    const std::vector<double>& oMatrix = oTags.moMatrix;
    if (oMatrix.size() < MATRIX_VALUES)
        return false;
    oInfo = GeocodingInfo(oMatrix[3], oMatrix[0], oMatrix[1], oMatrix[7], oMatrix[4], oMatrix[5]);
    return true;
}

bool ReadScale(const GeoTags& oTags, GeocodingInfo& oInfo)
{
    const std::vector<double>& oScale = oTags.moScale;
    const std::vector<double>& oTie = oTags.moTiePoints;
    if (oScale.size() < 2 || oTie.size() < TIE_POINT_VALUES)
        return false;
    oInfo =
        GeocodingInfo(oTie[3] - oTie[0] * oScale[0], oScale[0], 0.0, oTie[4] + oTie[1] * oScale[1], 0.0, -oScale[1]);
    return true;
}

// From positions that are pixel centres to the outer corner of the first pixel.
GeocodingInfo ToCorner(const GeocodingInfo& oCentre)
{
    double nX = 0.0;
    double nY = 0.0;
    oCentre.RasterToMap(-HALF_PIXEL, -HALF_PIXEL, nX, nY);
    return GeocodingInfo(nX, oCentre.GetXPerColumn(), oCentre.GetXPerRow(), nY, oCentre.GetYPerColumn(),
                         oCentre.GetYPerRow());
}

bool IsFinite(const TiePoint& oPoint)
{
    return std::isfinite(oPoint.column) && std::isfinite(oPoint.row) && std::isfinite(oPoint.x) &&
           std::isfinite(oPoint.y) && std::isfinite(oPoint.z);
}

bool IsSameSystem(const GeoTags& oTags, const krv::ogc::cs::ICRS& oCRS)
{
    try
    {
        const std::unique_ptr<krv::ogc::cs::ICRS> poRead = ReadCRS(oTags, {});
        return poRead && poRead->IsEquivalent(oCRS) && poRead->HasVertical() == oCRS.HasVertical();
    }
    catch (const krv::DataException&)
    {
        return false;
    }
}

} // namespace

bool IsPixelPoint(const GeoTags& oTags)
{
    return GeoKeyList::From(oTags).GetCode(GTRasterTypeGeoKey) == RasterPixelIsPoint;
}

bool ReadGeocoding(const GeoTags& oTags, GeocodingInfo& oInfo)
{
    GeocodingInfo oFound;
    if (!ReadMatrix(oTags, oFound) && !ReadScale(oTags, oFound))
        return false;
    if (IsPixelPoint(oTags))
        oFound = ToCorner(oFound);
    if (!oFound.IsInvertible())
        return false;
    oInfo = oFound;
    return true;
}

std::vector<TiePoint> ReadTiePoints(const GeoTags& oTags)
{
    const std::vector<double>& oValues = oTags.moTiePoints;
    const double nShift = IsPixelPoint(oTags) ? HALF_PIXEL : 0.0;
    std::vector<TiePoint> oPoints;
    for (std::size_t nAt = 0; nAt + TIE_POINT_VALUES <= oValues.size(); nAt += TIE_POINT_VALUES)
    {
        const double* poValues = oValues.data() + nAt;
        const TiePoint oPoint = {poValues[0] + nShift, poValues[1] + nShift, poValues[3], poValues[4], poValues[5]};
        if (IsFinite(oPoint))
            oPoints.push_back(oPoint);
    }
    return oPoints;
}

void SetGeocoding(GeoTags& oTags, const GeocodingInfo& oInfo)
{
    oTags.moScale.clear();
    oTags.moTiePoints.clear();
    oTags.moMatrix.clear();
    if (oInfo.IsIdentity())
        return;
    double nX = oInfo.GetXOffset();
    double nY = oInfo.GetYOffset();
    if (IsPixelPoint(oTags))
        oInfo.RasterToMap(HALF_PIXEL, HALF_PIXEL, nX, nY);
    if (!oInfo.IsRotated() && oInfo.GetXPerColumn() > 0 && oInfo.GetYPerRow() < 0)
    {
        oTags.moScale = {oInfo.GetXPerColumn(), -oInfo.GetYPerRow(), 0.0};
        oTags.moTiePoints = {0.0, 0.0, 0.0, nX, nY, 0.0};
        return;
    }
    oTags.moMatrix = {oInfo.GetXPerColumn(),
                      oInfo.GetXPerRow(),
                      0.0,
                      nX,
                      oInfo.GetYPerColumn(),
                      oInfo.GetYPerRow(),
                      0.0,
                      nY,
                      0.0,
                      0.0,
                      0.0,
                      0.0,
                      0.0,
                      0.0,
                      0.0,
                      1.0};
}

void SetRasterType(GeoTags& oTags, bool bPoint)
{
    GeocodingInfo oInfo;
    const bool bShift = ReadGeocoding(oTags, oInfo) && bPoint != IsPixelPoint(oTags);
    GeoKeyList oKeys = GeoKeyList::From(oTags);
    oKeys.Set(GTRasterTypeGeoKey, static_cast<std::uint16_t>(bPoint ? RasterPixelIsPoint : RasterPixelIsArea));
    oKeys.Store(oTags);
    if (bShift)
        SetGeocoding(oTags, oInfo);
}

void RemoveRasterType(GeoTags& oTags)
{
    if (IsPixelPoint(oTags))
        SetRasterType(oTags, false);
    GeoKeyList oKeys = GeoKeyList::From(oTags);
    oKeys.Remove(GTRasterTypeGeoKey);
    if (oKeys.IsEmpty())
        oKeys.Store(oTags);
}

void SetTiePoints(GeoTags& oTags, const std::vector<TiePoint>& oPoints)
{
    const double nShift = IsPixelPoint(oTags) ? HALF_PIXEL : 0.0;
    oTags.moTiePoints.clear();
    for (const TiePoint& oPoint : oPoints)
        oTags.moTiePoints.insert(oTags.moTiePoints.end(),
                                 {oPoint.column - nShift, oPoint.row - nShift, 0.0, oPoint.x, oPoint.y, oPoint.z});
}

void RemoveCRS(GeoTags& oTags)
{
    const bool bPoint = IsPixelPoint(oTags);
    GeoKeyList oKeys;
    if (bPoint) // where the centres of pixels are placed they stay so
        oKeys.Set(GTRasterTypeGeoKey, static_cast<std::uint16_t>(RasterPixelIsPoint));
    oKeys.Store(oTags);
}

void SetCRS(GeoTags& oTags, const krv::ogc::cs::ICRS& oCRS, const std::string& fileName, const krv::Place& oPlace)
{
    const std::uint16_t nRasterType = GeoKeyList::From(oTags).GetCode(GTRasterTypeGeoKey, RasterPixelIsArea);
    for (GeoKeyList& oKeys : ProposeKeys(oCRS))
    {
        oKeys.Set(GTRasterTypeGeoKey, nRasterType);
        GeoTags oTried = oTags;
        oKeys.Store(oTried);
        if (!IsSameSystem(oTried, oCRS))
            continue;
        oTags = std::move(oTried);
        return;
    }
    throw krv::DataException(
        fileName + ": the reference system \"" + oCRS.GetName() + "\" cannot be expressed by geographic keys", oPlace);
}

} // namespace krv::plugins::support
