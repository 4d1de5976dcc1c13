#include "plugins/tif/geo/geokeys.h"

#include "plugins/tif/geo/geokeylist.h"
#include "plugins/tif/reading/tiffvalues.h"

#include <cmath>
#include <cstddef>

#include <geotiff.h>
#include <geovalues.h>
#include <xtiffio.h>

namespace krv::plugins::tif
{
namespace
{

using krv::ogc::cs::GeocodingInfo;

constexpr std::size_t MATRIX_VALUES = 16;   // four rows of four
constexpr std::size_t TIE_POINT_VALUES = 6; // column, row, level, x, y, z
constexpr double HALF_PIXEL = 0.5;

bool ReadMatrix(TIFF* poFile, GeocodingInfo& oInfo)
{
    const std::vector<double> oMatrix = ReadDoubles(poFile, TIFFTAG_GEOTRANSMATRIX);
    if (oMatrix.size() < MATRIX_VALUES)
        return false;
    oInfo = GeocodingInfo(oMatrix[3], oMatrix[0], oMatrix[1], oMatrix[7], oMatrix[4], oMatrix[5]);
    return true;
}

bool ReadScale(TIFF* poFile, GeocodingInfo& oInfo)
{
    const std::vector<double> oScale = ReadDoubles(poFile, TIFFTAG_GEOPIXELSCALE);
    const std::vector<double> oTie = ReadDoubles(poFile, TIFFTAG_GEOTIEPOINTS);
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

} // namespace

void RegisterGeoTags()
{
    static const bool bDone = (XTIFFInitialize(), true);
    static_cast<void>(bDone);
}

bool IsPixelPoint(TIFF* poFile)
{
    return GeoKeyList::From(poFile).GetCode(GTRasterTypeGeoKey) == RasterPixelIsPoint;
}

bool ReadGeocoding(TIFF* poFile, GeocodingInfo& oInfo)
{
    GeocodingInfo oFound;
    if (!ReadMatrix(poFile, oFound) && !ReadScale(poFile, oFound))
        return false;
    if (IsPixelPoint(poFile))
        oFound = ToCorner(oFound);
    if (!oFound.IsInvertible())
        return false;
    oInfo = oFound;
    return true;
}

std::vector<TiePoint> ReadTiePoints(TIFF* poFile)
{
    const std::vector<double> oValues = ReadDoubles(poFile, TIFFTAG_GEOTIEPOINTS);
    const double nShift = IsPixelPoint(poFile) ? HALF_PIXEL : 0.0;
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

} // namespace krv::plugins::tif
