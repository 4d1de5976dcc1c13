#pragma once

#include "gobs/resampling/interpolator.h"

#include <memory>

namespace krv::gobs
{

// Rows of pixels whose places lie in columns and rows of the image: those of all rows have the same x. What depends on
// the columns alone is worked out once, and kernels go along the axes one after the other. A result does not depend on
// the window, nor on the pixels that are made with it. One thread at a time.
// Made for one result, thrown away with it. The order of the virtual operations is fixed.
class KRV_GOBS_API IGridRows
{
public:
    virtual ~IGridRows();

    // The row of pixels at one y, as IInterpolator::Run has them.
    // nY: in the image, continuous, as the places in x are.
    virtual bool Run(const InterpolationWindow& oWindow, double nY, unsigned char* pPixels, unsigned char* pValid) = 0;
};

// poInterpolator, of the same type, channels and rule, makes what lies at borders and beside pixels that are not valid;
// it is borrowed. Null for a method and a type that have no quicker way than the interpolator's: modes, footprints that
// are turned, and, but for nearest, 8S by kernels, integers of more than two bytes and 64R.
// pX: nCount places, copied.
KRV_GOBS_API std::unique_ptr<IGridRows> MakeGridRows(const DataType& oType, unsigned int nChannels,
                                                     const InterpolationRule& oRule, const IInterpolator& oInterpolator,
                                                     const double* pX, std::size_t nCount);

} // namespace krv::gobs
