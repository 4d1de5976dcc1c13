#include "toolkit/mathmodel/findground.h"

#include "toolkit/mathmodel/imathmodel.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>

namespace krv::mathmodel
{

namespace
{

constexpr double CLOSE_ENOUGH = 1e-3; // metres
constexpr int STEPS = 100;            // halving a height of many kilometres takes fewer than thirty

} // namespace

bool FindGround(const IMathModel& oModel, double nColumn, double nRow, const TerrainHeight& oTerrain,
                double nStartHeight, double& nLongitude, double& nLatitude, double& nHeight)
{
    std::optional<double> oBelow; // heights at which the line of sight is below and above the terrain
    std::optional<double> oAbove;
    double nAt = nStartHeight;
    double nLastGap = std::numeric_limits<double>::infinity();
    for (int nStep = 0; nStep < STEPS; ++nStep)
    {
        double nEast = 0, nNorth = 0, nTerrain = 0;
        if (!oModel.ImageToGround(nColumn, nRow, nAt, nEast, nNorth) || !oTerrain(nEast, nNorth, nTerrain))
            return false;
        const double nGap = nTerrain - nAt;
        (nGap > 0 ? oBelow : oAbove) = nAt;
        const bool bBetween = oBelow && oAbove;
        if (std::fabs(nGap) <= CLOSE_ENOUGH || (bBetween && std::fabs(*oAbove - *oBelow) <= CLOSE_ENOUGH))
        {
            nLongitude = nEast;
            nLatitude = nNorth;
            nHeight = nAt;
            return true;
        }
        const bool bInside = bBetween && nTerrain > std::min(*oBelow, *oAbove) && nTerrain < std::max(*oBelow, *oAbove);
        const bool bConverges = std::fabs(nGap) <= nLastGap / 2;
        nAt = bBetween && !(bInside && bConverges) ? (*oBelow + *oAbove) / 2 : nTerrain;
        nLastGap = std::fabs(nGap);
    }
    return false;
}

} // namespace krv::mathmodel
