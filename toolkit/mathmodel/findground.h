#pragma once

#include "toolkit/api.h"

#include <functional>

namespace krv::mathmodel
{

class IMathModel;

// The height of the ground above the ellipsoid, in metres, at a longitude and latitude in degrees; false where it is
// not known.
// It is called some ten times for a point. What it throws passes through FindGround.
using TerrainHeight = std::function<bool(double nLongitude, double nLatitude, double& nHeight)>;

// Where the line of sight of an image position meets the terrain, to within a millimetre of height. The search begins
// at nStartHeight, takes the terrain's height below each point as the next one, and halves the interval between a point
// above and a point below the terrain where that does not converge. At a step of the terrain the place of the step is
// the result. False, with the results untouched, when the model does not reach a point or its terrain is not known.
// Example, on a plane of 400 m: FindGround(oModel, 100.5, 200.5, [](double, double, double& nHeight) { nHeight = 400;
// return true; }, 400, nLongitude, nLatitude, nHeight).
KRV_TOOLKIT_API bool FindGround(const IMathModel& oModel, double nColumn, double nRow, const TerrainHeight& oTerrain,
                                double nStartHeight, double& nLongitude, double& nLatitude, double& nHeight);

} // namespace krv::mathmodel
