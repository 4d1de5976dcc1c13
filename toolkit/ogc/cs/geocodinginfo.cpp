#include "toolkit/ogc/cs/geocodinginfo.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace krv::ogc::cs
{

GeocodingInfo::GeocodingInfo() : GeocodingInfo(0.0, 1.0, 0.0, 0.0, 0.0, 1.0) {}

GeocodingInfo::GeocodingInfo(double nXOffset, double nXPerColumn, double nXPerRow, double nYOffset, double nYPerColumn,
                             double nYPerRow)
    : moTerms{nXOffset, nXPerColumn, nXPerRow, nYOffset, nYPerColumn, nYPerRow}
{
}

void GeocodingInfo::RasterToMap(double nColumn, double nRow, double& nX, double& nY) const
{
    nX = moTerms[0] + moTerms[1] * nColumn + moTerms[2] * nRow;
    nY = moTerms[3] + moTerms[4] * nColumn + moTerms[5] * nRow;
}

bool GeocodingInfo::MapToRaster(double nX, double nY, double& nColumn, double& nRow) const
{
    if (!IsInvertible())
        return false;
    const double nDeterminant = Determinant();
    const double nEast = nX - moTerms[0];
    const double nNorth = nY - moTerms[3];
    nColumn = (nEast * moTerms[5] - nNorth * moTerms[2]) / nDeterminant;
    nRow = (nNorth * moTerms[1] - nEast * moTerms[4]) / nDeterminant;
    return true;
}

bool GeocodingInfo::IsInvertible() const
{
    if (!std::all_of(moTerms.begin(), moTerms.end(), [](double nTerm) { return std::isfinite(nTerm); }))
        return false;
    const double nScale = std::abs(moTerms[1] * moTerms[5]) + std::abs(moTerms[2] * moTerms[4]);
    const double nDeterminant = Determinant();
    return std::isnormal(nDeterminant) &&
           std::abs(nDeterminant) > 4.0 * std::numeric_limits<double>::epsilon() * nScale;
}

bool GeocodingInfo::IsIdentity() const
{
    return *this == GeocodingInfo();
}

bool GeocodingInfo::IsRotated() const
{
    return moTerms[2] != 0.0 || moTerms[4] != 0.0;
}

double GeocodingInfo::GetColumnSpacing() const
{
    return std::hypot(moTerms[1], moTerms[4]);
}

double GeocodingInfo::GetRowSpacing() const
{
    return std::hypot(moTerms[2], moTerms[5]);
}

bool GeocodingInfo::operator==(const GeocodingInfo& oOther) const
{
    return moTerms == oOther.moTerms;
}

double GeocodingInfo::Determinant() const
{
    return moTerms[1] * moTerms[5] - moTerms[2] * moTerms[4];
}

} // namespace krv::ogc::cs
