#pragma once

#include "toolkit/api.h"

#include <string>

namespace krv::mathmodel
{

// A sensor model: the relation between image positions and the ground.
// Image positions are continuous: (0, 0) is the outer corner of the first pixel, (0.5, 0.5) its centre; columns grow to
// the right, rows downwards. Ground positions are geographic on WGS 84: longitude (east positive) and latitude (north
// positive) in degrees, height in metres above the ellipsoid. Positions outside the image are allowed as far as the
// model reaches. Immutable once built; one thread at a time, a clone may go to another thread.
// Example: the place of the image's centre at 250 m:
//   double nLongitude, nLatitude;
//   poModel->ImageToGround(nWidth / 2.0, nHeight / 2.0, 250, nLongitude, nLatitude);
// The order of the virtual operations is public and fixed.
class KRV_TOOLKIT_API IMathModel
{
public:
    virtual ~IMathModel();

    // The ground position seen at an image position, at the given height.
    // False, with the results untouched, when the line of sight does not meet that height or the model does not reach
    // it.
    virtual bool ImageToGround(double nColumn, double nRow, double nHeight, double& nLongitude,
                               double& nLatitude) const = 0;

    // The image position of a ground position. False, with the results untouched, when the model does not reach it.
    virtual bool GroundToImage(double nLongitude, double nLatitude, double nHeight, double& nColumn,
                               double& nRow) const = 0;

    // A new, independent object that the caller owns.
    virtual IMathModel* Clone() const = 0;

    // What kind of model it is, such as "RPC".
    // For people and logs. Never empty.
    virtual std::string GetName() const = 0;

    // The model of a reduced image of the same scene: a new object that the caller owns. The ratios are the width and
    // the height of the full image divided by those of the reduced one (2 for a level of half size). Offsets stay at
    // the outer corner, so a position (c, r) of the full image is (c / ratio, r / ratio) there. Throws
    // krv::ParameterException for a ratio that is not positive and finite.
    virtual IMathModel* CreateScaled(double nColumnRatio, double nRowRatio) const = 0;

    // The accuracy that the provider states: root mean square error on the ground in metres, negative when unknown.
    virtual double GetAccuracy() const = 0;
};

} // namespace krv::mathmodel
