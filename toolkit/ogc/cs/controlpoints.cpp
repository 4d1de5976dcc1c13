#include "toolkit/ogc/cs/controlpoints.h"

#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cmath>
#include <sstream>
#include <utility>

namespace krv::ogc::cs
{

namespace
{

using Row = std::vector<long double>;

std::size_t TermsOf(unsigned int nDegree)
{
    return (nDegree + 1) * (nDegree + 2) / 2;
}

// Solves a square system with two right-hand sides in its last columns; false when it determines nothing.
bool Solve(std::vector<Row>& oRows)
{
    const std::size_t nSize = oRows.size();
    for (std::size_t n = 0; n < nSize; ++n)
    {
        const auto oPivot = std::max_element(oRows.begin() + static_cast<std::ptrdiff_t>(n), oRows.end(),
                                             [n](const Row& oOne, const Row& oOther)
                                             { return std::fabs(oOne[n]) < std::fabs(oOther[n]); });
        constexpr long double LEAST = 1e-12L;
        if (!(std::fabs((*oPivot)[n]) > LEAST))
            return false;
        std::swap(oRows[n], *oPivot);
        for (std::size_t nRow = 0; nRow < nSize; ++nRow)
        {
            const long double nFactor = nRow == n ? 0 : oRows[nRow][n] / oRows[n][n];
            for (std::size_t i = n; nFactor != 0 && i < nSize + 2; ++i)
                oRows[nRow][i] -= nFactor * oRows[n][i];
        }
    }
    return true;
}

template <typename Get>
std::pair<double, double> RangeOf(const std::vector<ControlPoint>& oPoints, const Get& oGet)
{
    double nLow = oGet(oPoints.front()), nHigh = nLow;
    for (const ControlPoint& oPoint : oPoints)
    {
        nLow = std::min(nLow, oGet(oPoint));
        nHigh = std::max(nHigh, oGet(oPoint));
    }
    const double nHalf = nHigh / 2 - nLow / 2;
    return {nLow + nHalf, nHalf > 0 ? nHalf : 1};
}

} // namespace

std::vector<ControlPoint> ParseControlPoints(const std::string& text)
{
    std::vector<ControlPoint> oPoints;
    std::istringstream oTexts(text);
    for (std::string point; std::getline(oTexts, point, ';');)
    {
        std::vector<double> oNumbers;
        std::istringstream oWords(point);
        for (std::string word; oWords >> word;)
        {
            const auto oNumber = krv::ParseNumber<double>(word);
            if (!oNumber || !std::isfinite(*oNumber))
                return {};
            oNumbers.push_back(*oNumber);
        }
        if (oNumbers.size() != 5)
            return {};
        oPoints.push_back({oNumbers[0], oNumbers[1], oNumbers[2], oNumbers[3], oNumbers[4]});
    }
    return oPoints;
}

PolynomialFit::PolynomialFit(const std::vector<ControlPoint>& oPoints, unsigned int nDegree, Direction eDirection)
    : mnDegree(nDegree)
{
    if (nDegree < 1 || nDegree > 3)
        throw krv::ParameterException("Control points are fitted by polynomials of degree 1 to 3",
                                      krv::ParameterException::eInvalidValue, "nDegree");
    const std::size_t nTerms = TermsOf(nDegree);
    if (oPoints.size() < nTerms)
        throw krv::DataException("A polynomial of degree " + std::to_string(nDegree) + " needs " +
                                 std::to_string(nTerms) + " control points, there are " +
                                 std::to_string(oPoints.size()));
    const bool bToMap = eDirection == eRasterToMap;
    const auto First = [=](const ControlPoint& o)
    {
        return bToMap ? o.column : o.x;
    };
    const auto Second = [=](const ControlPoint& o)
    {
        return bToMap ? o.row : o.y;
    };
    const auto FirstResult = [=](const ControlPoint& o)
    {
        return bToMap ? o.x : o.column;
    };
    const auto SecondResult = [=](const ControlPoint& o)
    {
        return bToMap ? o.y : o.row;
    };
    const auto Scaled = [](const std::pair<double, double>& oRange)
    {
        return Scale{oRange.first, oRange.second};
    };
    moFirst = Scaled(RangeOf(oPoints, First));
    moSecond = Scaled(RangeOf(oPoints, Second));
    // Results around their centre, so that no digits go to a false origin.
    const auto [nFirstCentre, nFirstHalf] = RangeOf(oPoints, FirstResult);
    const auto [nSecondCentre, nSecondHalf] = RangeOf(oPoints, SecondResult);
    std::vector<Row> oNormal(nTerms, Row(nTerms + 2));
    for (const ControlPoint& oPoint : oPoints)
    {
        const std::vector<double> oTerms = MakeTerms(First(oPoint), Second(oPoint));
        for (std::size_t nRow = 0; nRow < nTerms; ++nRow)
        {
            for (std::size_t n = 0; n < nTerms; ++n)
                oNormal[nRow][n] += static_cast<long double>(oTerms[nRow]) * oTerms[n];
            oNormal[nRow][nTerms] += static_cast<long double>(oTerms[nRow]) * (FirstResult(oPoint) - nFirstCentre);
            oNormal[nRow][nTerms + 1] +=
                static_cast<long double>(oTerms[nRow]) * (SecondResult(oPoint) - nSecondCentre);
        }
    }
    if (!Solve(oNormal))
        throw krv::DataException("The control points do not determine a polynomial of degree " +
                                 std::to_string(nDegree) + ": they lie on one line or curve");
    for (std::size_t n = 0; n < nTerms; ++n)
    {
        moFirstTerms.push_back(static_cast<double>(oNormal[n][nTerms] / oNormal[n][n]));
        moSecondTerms.push_back(static_cast<double>(oNormal[n][nTerms + 1] / oNormal[n][n]));
    }
    moFirstTerms[0] += nFirstCentre;
    moSecondTerms[0] += nSecondCentre;
    double nSquares = 0;
    for (const ControlPoint& oPoint : oPoints)
    {
        double nOne = 0, nOther = 0;
        Map(First(oPoint), Second(oPoint), nOne, nOther);
        const double nDistance = std::hypot(nOne - FirstResult(oPoint), nOther - SecondResult(oPoint));
        nSquares += nDistance * nDistance;
        mnLargest = std::max(mnLargest, nDistance);
    }
    mnResidual = std::sqrt(nSquares / static_cast<double>(oPoints.size()));
}

std::vector<double> PolynomialFit::MakeTerms(double nFirst, double nSecond) const
{
    const double x = (nFirst - moFirst.mnCentre) / moFirst.mnHalf, y = (nSecond - moSecond.mnCentre) / moSecond.mnHalf;
    std::vector<double> oTerms = {1, x, y};
    if (mnDegree > 1)
        oTerms.insert(oTerms.end(), {x * x, x * y, y * y});
    if (mnDegree > 2)
        oTerms.insert(oTerms.end(), {x * x * x, x * x * y, x * y * y, y * y * y});
    return oTerms;
}

void PolynomialFit::Map(double nFirst, double nSecond, double& nFirstResult, double& nSecondResult) const
{
    const std::vector<double> oTerms = MakeTerms(nFirst, nSecond);
    nFirstResult = 0;
    nSecondResult = 0;
    for (std::size_t n = oTerms.size(); n-- > 0;)
    {
        nFirstResult += moFirstTerms[n] * oTerms[n];
        nSecondResult += moSecondTerms[n] * oTerms[n];
    }
}

GeocodingInfo PolynomialFit::GetAffine() const
{
    if (mnDegree != 1)
        throw krv::DataException("A polynomial of degree " + std::to_string(mnDegree) + " is no affine transform");
    const auto Offset = [&](const std::vector<double>& oTerms)
    {
        return oTerms[0] - oTerms[1] * moFirst.mnCentre / moFirst.mnHalf -
               oTerms[2] * moSecond.mnCentre / moSecond.mnHalf;
    };
    return {Offset(moFirstTerms),  moFirstTerms[1] / moFirst.mnHalf,  moFirstTerms[2] / moSecond.mnHalf,
            Offset(moSecondTerms), moSecondTerms[1] / moFirst.mnHalf, moSecondTerms[2] / moSecond.mnHalf};
}

unsigned int PolynomialFit::GetUsualDegree(std::size_t nPoints)
{
    unsigned int nDegree = nPoints >= TermsOf(1) ? 1 : 0;
    while (nDegree > 0 && nDegree < 3 && nPoints > 2 * TermsOf(nDegree + 1))
        ++nDegree;
    return nDegree;
}

} // namespace krv::ogc::cs
