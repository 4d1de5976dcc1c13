#pragma once

#include "toolkit/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <string>
#include <vector>

namespace krv::ogc::cs
{

// A place of an image whose map coordinates are known. Columns and rows are continuous, as GeocodingInfo has them.
// (0.5, 0.5) is the centre of the first pixel. x and y are in the unit of the system that the file records beside them.
struct ControlPoint
{
    double column = 0;
    double row = 0;
    double x = 0;
    double y = 0;
    double z = 0; // height; kept and written, but no part of a fit
};

// "column row x y z; ..." as formats keep ground control points; none for a text that is no such list.
// The text comes from files and may be anything: one number too few or a word in it makes the whole list none.
KRV_TOOLKIT_API std::vector<ControlPoint> ParseControlPoints(const std::string& text);

// A polynomial in two variables of degree 1, 2 or 3 for each of two results, fitted to control points by least squares.
// Coordinates are brought to -1 to 1 for that and back. Any thread.
// Example: PolynomialFit oFit(oPoints, PolynomialFit::GetUsualDegree(oPoints.size()), PolynomialFit::eMapToRaster);
// Time is linear in the number of points; points are not kept.
class KRV_TOOLKIT_API PolynomialFit
{
public:
    // The direction is fitted, not inverted: the two of one list of points are no exact inverses of each other.
    enum Direction
    {
        eRasterToMap = 0,
        eMapToRaster = 1
    };

    // Degree d needs (d + 1) * (d + 2) / 2 points. Throws krv::ParameterException for another degree, and
    // krv::DataException for too few points and for points that leave a term open, such as those on one line.
    PolynomialFit(const std::vector<ControlPoint>& oPoints, unsigned int nDegree, Direction eDirection);

    // eRasterToMap: column and row to x and y; eMapToRaster: the other way. Any numbers are taken, those far outside of
    // the points as well, where a polynomial means little. Results may replace the arguments.
    void Map(double nFirst, double nSecond, double& nFirstResult, double& nSecondResult) const;

    // How far the points lie from where they should, in the unit of the result: the root of the mean square distance,
    // and the largest.
    double GetResidual() const { return mnResidual; }

    // Units as GetResidual. A single bad point shows here first: compare it with the root mean square.
    double GetLargestResidual() const { return mnLargest; }

    // The transform of a polynomial of degree 1. Throws krv::DataException for others.
    // For formats that keep a transform and no points. Meant for eRasterToMap, the direction of GeocodingInfo.
    GeocodingInfo GetAffine() const;

    // The largest degree, up to 3, that as many points determine with points to spare; 0 for fewer than 3 points.
    // What the command and the readers take where nobody asks for a degree.
    static unsigned int GetUsualDegree(std::size_t nPoints);

private:
    // How coordinates are brought to -1 to 1.
    struct Scale
    {
        double mnCentre = 0;
        double mnHalf = 1;
    };

    std::vector<double> MakeTerms(double nFirst, double nSecond) const;

    unsigned int mnDegree;
    Scale moFirst;
    Scale moSecond;
    std::vector<double> moFirstTerms;  // of the polynomial of x or column
    std::vector<double> moSecondTerms; // of y or row
    double mnResidual = 0;             // root mean square
    double mnLargest = 0;
};

} // namespace krv::ogc::cs
