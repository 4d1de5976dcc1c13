#pragma once

#include "gobs/resampling/interpolator.h"

#include <cmath>

namespace krv::gobs::detail
{

// The kernels, at a distance from their centre in pixels.
inline double BilinearAt(double nDistance)
{
    const double n = std::fabs(nDistance);
    return n < 1 ? 1 - n : 0;
}

// Keys, with a = -0.5.
inline double CubicAt(double nDistance)
{
    constexpr double A = -0.5;
    const double n = std::fabs(nDistance);
    if (n <= 1)
        return ((A + 2) * n - (A + 3)) * n * n + 1;
    return n < 2 ? A * (((n - 5) * n + 8) * n - 4) : 0;
}

inline double LanczosAt(double nDistance)
{
    constexpr double PI = 3.14159265358979323846;
    const double n = std::fabs(nDistance) * PI;
    if (n >= 3 * PI)
        return 0;
    return n == 0 ? 1 : 3 * std::sin(n) * std::sin(n / 3) / (n * n);
}

// What rounding leaves of places in the middle between pixels or of one, in pixels.
constexpr double ROUNDING = 1e-9;

inline double KernelAt(Resampling eMethod, double nDistance)
{
    const double nWhole = std::nearbyint(nDistance);
    if (std::fabs(nDistance - nWhole) < ROUNDING)
        return nWhole == 0 ? 1 : 0;
    if (eMethod == Resampling::eBilinear)
        return BilinearAt(nDistance);
    return eMethod == Resampling::eCubic ? CubicAt(nDistance) : LanczosAt(nDistance);
}

inline double RadiusOf(Resampling eMethod)
{
    return static_cast<double>(GetKernelRadius(eMethod));
}

// The first pixel that a kernel at a place reaches, and the one behind the last. Those inside where it crosses zero
// are among them: they weigh nothing, but results keep to the range of all, as those of levels do.
struct TapRange
{
    TapRange(Resampling eMethod, double nPlace, double nStretch)
        : mnFirst(static_cast<long long>(std::floor(nPlace - 0.5 - RadiusOf(eMethod) * nStretch + ROUNDING)) + 1),
          mnEnd(static_cast<long long>(std::ceil(nPlace - 0.5 + RadiusOf(eMethod) * nStretch - ROUNDING)))
    {
    }

    long long mnFirst;
    long long mnEnd;
};

// Whether a part of a footprint, from its middle, lies in it: its first edge belongs to it.
inline bool IsInFootprint(double nPart)
{
    return nPart >= -0.5 - ROUNDING && nPart < 0.5 - ROUNDING;
}

} // namespace krv::gobs::detail
