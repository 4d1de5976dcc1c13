#pragma once

#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// The geographic part of a TIFF directory as plain values, whichever file the directory is in; empty where a tag is
// absent.
// A plain value. TIFF files hold them, and the GeoTIFF boxes of JPEG 2000.
struct GeoTags
{
    std::vector<double> moScale;       // 33550
    std::vector<double> moTiePoints;   // 33922
    std::vector<double> moMatrix;      // 34264
    std::vector<std::uint16_t> moKeys; // 34735
    std::vector<double> moDoubles;     // 34736
    std::string moTexts;               // 34737
};

// Numbers of the tags, in the order of the members above.
constexpr std::uint16_t TAG_GEO_SCALE = 33550;
constexpr std::uint16_t TAG_GEO_TIE_POINTS = 33922;
constexpr std::uint16_t TAG_GEO_MATRIX = 34264;
constexpr std::uint16_t TAG_GEO_KEYS = 34735;
constexpr std::uint16_t TAG_GEO_DOUBLES = 34736;
constexpr std::uint16_t TAG_GEO_TEXTS = 34737;

// A raster position and the map position that belongs to it. Raster coordinates are continuous, (0, 0) being the outer
// corner of the first pixel, whatever the file's own convention is.
// In map units of the reference system, z in its vertical unit.
struct TiePoint
{
    double column = 0.0; // pixels, continuous
    double row = 0.0;
    double x = 0.0; // easting or longitude
    double y = 0.0;
    double z = 0.0; // 0 where the file says none
};

// Whether raster positions are pixel centres. False when nothing is said, or nothing sensible.
bool IsPixelPoint(const GeoTags& oTags);

// The affine transform of the image: from the transformation matrix, else from the pixel scale and the first tie point.
// The result is for the outer corner of the first pixel; where the file says that its positions are pixel centres
// (GeoKey 1025 is 2) half a pixel is taken off. False, with the result untouched, when the file holds none: no tags,
// tie points without a scale (those are control points), tags that are too short, or values that are not finite or
// without an inverse.
bool ReadGeocoding(const GeoTags& oTags, krv::ogc::cs::GeocodingInfo& oInfo);

// All tie points, in their order; those with a value that is not finite are left out.
// Half a pixel is added where the file counts from pixel centres.
std::vector<TiePoint> ReadTiePoints(const GeoTags& oTags);

// The reference system that the geographic keys define. A code of the EPSG database wins over whatever other keys say
// of the same thing; everything user-defined is built from its parts. Null when there are no keys, or none that name a
// system, and when they contradict each other; what contradicts what goes to pTrouble then. Throws krv::DataException
// with the file's name and the cause for damaged keys, for codes that are not known, and for definitions that are
// incomplete or cannot be expressed.
std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS(const GeoTags& oTags, const std::string& fileName,
                                            std::string* pTrouble = nullptr,
                                            const krv::Place& oPlace = krv::Place::Current());

// For the outer corner of the first pixel; the identity removes what is there. Pixel scale and tie point where they can
// say it, else the matrix.
// Tie points that are control points go; the raster type stays.
void SetGeocoding(GeoTags& oTags, const krv::ogc::cs::GeocodingInfo& oInfo);
// What positions in the file mean; the geocoding stays what it is.
// bPoint: positions are pixel centres. The numbers in the file change by half a pixel, so that the place does not.
void SetRasterType(GeoTags& oTags, bool bPoint);
// Goes only where no other key needs it.
void RemoveRasterType(GeoTags& oTags);
// In place of a geocoding.
// oPoints: with (0, 0) as the outer corner; none removes what is there.
void SetTiePoints(GeoTags& oTags, const std::vector<TiePoint>& oPoints);
// By its code, else by its parts, else as a text: the first of these that reads back as the same system. Throws
// DataException that names the file when none does, and changes nothing.
void SetCRS(GeoTags& oTags, const krv::ogc::cs::ICRS& oCRS, const std::string& fileName, const krv::Place& oPlace);
// The geocoding stays as it is.
void RemoveCRS(GeoTags& oTags);

} // namespace krv::plugins::support
