#include "plugins/tif/geo/geokeys.h"

#include "plugins/tif/reading/tiffvalues.h"

#include <xtiffio.h>

namespace krv::plugins::tif
{

void RegisterGeoTags()
{
    static const bool bDone = (XTIFFInitialize(), true);
    static_cast<void>(bDone);
}

support::GeoTags ReadGeoTags(TIFF* poFile)
{
    return {ReadDoubles(poFile, support::TAG_GEO_SCALE),   ReadDoubles(poFile, support::TAG_GEO_TIE_POINTS),
            ReadDoubles(poFile, support::TAG_GEO_MATRIX),  ReadShorts(poFile, support::TAG_GEO_KEYS),
            ReadDoubles(poFile, support::TAG_GEO_DOUBLES), ReadText(poFile, support::TAG_GEO_TEXTS)};
}

bool IsPixelPoint(TIFF* poFile)
{
    return support::IsPixelPoint(ReadGeoTags(poFile));
}

bool ReadGeocoding(TIFF* poFile, krv::ogc::cs::GeocodingInfo& oInfo)
{
    return support::ReadGeocoding(ReadGeoTags(poFile), oInfo);
}

std::vector<TiePoint> ReadTiePoints(TIFF* poFile)
{
    return support::ReadTiePoints(ReadGeoTags(poFile));
}

std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS(TIFF* poFile, std::string* pTrouble, const krv::Place& oPlace)
{
    return support::ReadCRS(ReadGeoTags(poFile), TIFFFileName(poFile), pTrouble, oPlace);
}

} // namespace krv::plugins::tif
