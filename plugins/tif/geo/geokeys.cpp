#include "plugins/tif/geo/geokeys.h"

#include "plugins/tif/reading/tiffvalues.h"

#include <tiffio.h>

#include <cstdint>
#include <iterator>

namespace krv::plugins::tif
{

namespace
{

TIFFExtendProc spBefore = nullptr;

void AddGeoTags(TIFF* poFile)
{
    // The names are those that the library's messages call them by.
    static const auto Field = [](std::uint32_t nTag, TIFFDataType eType, const char* pName)
    {
        return TIFFFieldInfo{nTag, TIFF_VARIABLE,       TIFF_VARIABLE,           eType, FIELD_CUSTOM,
                             1,    eType != TIFF_ASCII, const_cast<char*>(pName)};
    };
    static const TIFFFieldInfo FIELDS[] = {Field(support::TAG_GEO_SCALE, TIFF_DOUBLE, "GeoPixelScale"),
                                           Field(support::TAG_GEO_TIE_POINTS, TIFF_DOUBLE, "GeoTiePoints"),
                                           Field(support::TAG_GEO_MATRIX, TIFF_DOUBLE, "GeoTransformationMatrix"),
                                           Field(support::TAG_GEO_KEYS, TIFF_SHORT, "GeoKeyDirectory"),
                                           Field(support::TAG_GEO_DOUBLES, TIFF_DOUBLE, "GeoDoubleParams"),
                                           Field(support::TAG_GEO_TEXTS, TIFF_ASCII, "GeoASCIIParams")};
    TIFFMergeFieldInfo(poFile, FIELDS, std::size(FIELDS));
    if (spBefore != nullptr)
        spBefore(poFile);
}

} // namespace

void RegisterGeoTags()
{
    static const bool bDone = (spBefore = TIFFSetTagExtender(&AddGeoTags), true);
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
