#pragma once

#include "toolkit/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <string>
#include <vector>

namespace krv::ogc::cs
{

// A place of an image whose map coordinates are known. Columns and rows are continuous, as GeocodingInfo has them.
struct ControlPoint
{
    double column = 0;
    double row = 0;
    double x = 0;
    double y = 0;
    double z = 0;
};

// "column row x y z; ..." as formats keep ground control points; none for a text that is no such list.
KRV_TOOLKIT_API std::vector<ControlPoint> ParseControlPoints(const std::string& text);

// A polynomial in two variables of degree 1, 2 or 3 for each of two results, fitted to control points by least squares.
// Coordinates are brought to -1 to 1 for that and back. Any thread.
class KRV_TOOLKIT_API PolynomialFit
{
public:
    enum Direction
    {
        eRasterToMap = 0,
        eMapToRaster = 1
    };

    // Degree d needs (d + 1) * (d + 2) / 2 points. Throws krv::ParameterException for another degree, and
    // krv::DataException for too few points and for points that leave a term open, such as those on one line.
    PolynomialFit(const std::vector<ControlPoint>& oPoints, unsigned int nDegree, Direction eDirection);

    void Map(double nFirst, double nSecond, double& nFirstResult, double& nSecondResult) const;

    // How far the points lie from where they should, in the unit of the result: the root of the mean square distance,
    // and the largest.
    double GetResidual() const { return mnResidual; }
    double GetLargestResidual() const { return mnLargest; }

    // The transform of a polynomial of degree 1. Throws krv::DataException for others.
    GeocodingInfo GetAffine() const;

    // The largest degree, up to 3, that as many points determine with points to spare; 0 for fewer than 3 points.
    static unsigned int GetUsualDegree(std::size_t nPoints);

private:
    struct Scale
    {
        double mnCentre = 0;
        double mnHalf = 1;
    };

    std::vector<double> MakeTerms(double nFirst, double nSecond) const;

    unsigned int mnDegree;
    Scale moFirst;
    Scale moSecond;
    std::vector<double> moFirstTerms;
    std::vector<double> moSecondTerms;
    double mnResidual = 0;
    double mnLargest = 0;
};

} // namespace krv::ogc::cs
