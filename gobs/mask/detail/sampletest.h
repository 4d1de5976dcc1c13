#pragma once

#include "gobs/mask/samplematch.h"
#include "gobs/raster/complex.h"

#include <cmath>
#include <type_traits>

namespace krv::gobs::detail
{

template <class Sample>
bool IsNaN(const Sample& nSample)
{
    if constexpr (std::is_floating_point_v<Sample>)
        return std::isnan(nSample);
    else
        return false;
}

template <class Part>
bool IsNaN(const Complex<Part>& oSample)
{
    return IsNaN(oSample.mnReal) && IsNaN(oSample.mnImaginary);
}

// The test of one channel, in the type of its samples.
template <class Sample>
struct SampleTest
{
    unsigned int mnChannel; // from 0
    Sample mnValue;
    bool mbNaN; // NaN samples match too

    bool Matches(const Sample& nSample) const { return nSample == mnValue || (mbNaN && IsNaN(nSample)); }
};

} // namespace krv::gobs::detail
