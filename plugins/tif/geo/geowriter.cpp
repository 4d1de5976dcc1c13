#include "plugins/tif/geo/geowriter.h"

#include "plugins/tif/geo/crskeys.h"
#include "toolkit/exceptions/exceptions.h"

#include <geokeys.h>
#include <geovalues.h>

namespace krv::plugins::tif
{

namespace
{

using krv::ogc::cs::GeocodingInfo;

constexpr std::uint16_t TAG_SCALE = 33550;
constexpr std::uint16_t TAG_TIE_POINTS = 33922;
constexpr std::uint16_t TAG_MATRIX = 34264;
constexpr double HALF_PIXEL = 0.5;

} // namespace

bool GeoWriter::IsPoint() const
{
    return GeoKeyList::From(mpoPage->moTags).GetCode(GTRasterTypeGeoKey, RasterPixelIsArea) == RasterPixelIsPoint;
}

void GeoWriter::SetGeocoding(const GeocodingInfo& oInfo)
{
    TagList& oTags = mpoPage->moTags;
    oTags.Remove(TAG_SCALE);
    oTags.Remove(TAG_TIE_POINTS);
    oTags.Remove(TAG_MATRIX);
    if (oInfo.IsIdentity())
        return;
    double nX = oInfo.GetXOffset();
    double nY = oInfo.GetYOffset();
    if (IsPoint())
        oInfo.RasterToMap(HALF_PIXEL, HALF_PIXEL, nX, nY);
    if (!oInfo.IsRotated() && oInfo.GetXPerColumn() > 0 && oInfo.GetYPerRow() < 0)
    {
        oTags.SetDoubles(TAG_SCALE, {oInfo.GetXPerColumn(), -oInfo.GetYPerRow(), 0.0});
        return oTags.SetDoubles(TAG_TIE_POINTS, {0.0, 0.0, 0.0, nX, nY, 0.0});
    }
    oTags.SetDoubles(TAG_MATRIX, {oInfo.GetXPerColumn(), oInfo.GetXPerRow(), 0.0, nX, oInfo.GetYPerColumn(),
                                  oInfo.GetYPerRow(), 0.0, nY, 0.0, 0.0, 0.0, 0.0, 0.0, 0.0, 0.0, 1.0});
}

void GeoWriter::SetRasterType(bool bPoint)
{
    GeocodingInfo oInfo;
    const bool bGeocoded = ReadGeocoding(moEditor.OpenPage(mpoPage)->GetTiff(), oInfo);
    const bool bShift = bGeocoded && bPoint != IsPoint();
    GeoKeyList oKeys = GeoKeyList::From(mpoPage->moTags);
    oKeys.Set(GTRasterTypeGeoKey, static_cast<std::uint16_t>(bPoint ? RasterPixelIsPoint : RasterPixelIsArea));
    oKeys.Store(mpoPage->moTags);
    if (bShift)
        SetGeocoding(oInfo);
}

// It goes only where no other key needs it.
void GeoWriter::RemoveRasterType()
{
    if (IsPoint())
        SetRasterType(false);
    GeoKeyList oKeys = GeoKeyList::From(mpoPage->moTags);
    oKeys.Remove(GTRasterTypeGeoKey);
    if (oKeys.IsEmpty())
        oKeys.Store(mpoPage->moTags);
}

void GeoWriter::SetTiePoints(const std::vector<TiePoint>& oPoints)
{
    const double nShift = IsPoint() ? HALF_PIXEL : 0.0;
    std::vector<double> oValues;
    for (const TiePoint& oPoint : oPoints)
        oValues.insert(oValues.end(), {oPoint.column - nShift, oPoint.row - nShift, 0.0, oPoint.x, oPoint.y, oPoint.z});
    mpoPage->moTags.Remove(TAG_TIE_POINTS);
    if (!oValues.empty())
        mpoPage->moTags.SetDoubles(TAG_TIE_POINTS, oValues);
}

bool GeoWriter::Try(const GeoKeyList& oKeys, const krv::ogc::cs::ICRS& oCRS)
{
    oKeys.Store(mpoPage->moTags);
    try
    {
        const std::unique_ptr<krv::ogc::cs::ICRS> poRead = ReadCRS(moEditor.OpenPage(mpoPage)->GetTiff());
        return poRead && poRead->IsEquivalent(oCRS) && poRead->HasVertical() == oCRS.HasVertical();
    }
    catch (const krv::DataException&)
    {
        return false;
    }
}

void GeoWriter::SetCRS(const krv::ogc::cs::ICRS& oCRS, const Place& oPlace)
{
    const GeoKeyList oOld = GeoKeyList::From(mpoPage->moTags);
    const std::uint16_t nRasterType = oOld.GetCode(GTRasterTypeGeoKey, RasterPixelIsArea);
    for (GeoKeyList& oKeys : ProposeKeys(oCRS))
    {
        oKeys.Set(GTRasterTypeGeoKey, nRasterType);
        if (Try(oKeys, oCRS))
            return;
    }
    oOld.Store(mpoPage->moTags);
    throw krv::DataException(moEditor.GetFileName() + ": the reference system \"" + oCRS.GetName() +
                                 "\" cannot be expressed by geographic keys",
                             oPlace);
}

} // namespace krv::plugins::tif
