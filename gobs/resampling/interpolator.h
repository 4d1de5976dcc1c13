#pragma once

#include "gobs/api.h"
#include "gobs/raster/datatype.h"
#include "gobs/resampling/resampling.h"

#include <array>
#include <cstddef>
#include <memory>

namespace krv::gobs
{

// How a pixel at a place between those of an image is made of them. Positions are continuous: pixel (x, y) covers
// [x, x + 1) by [y, y + 1).
// Footprints in pixels: {2, 0, 0, 2} for a result of half the resolution.
struct InterpolationRule
{
    // eNearest: the pixel at the place; one 1e-9 outside the image counts as inside. eBilinear, eCubic (Keys, -0.5),
    // eLanczos (3 lobes): the weights of these kernels around the place. eAverage, eMode: of the pixels whose centres
    // lie in the footprint, the nearest one where there are none. ParameterException for others.
    Resampling meMethod = Resampling::eNearest;
    // Kernels are stretched by these, from 1 on, for results coarser than the image.
    double mnXStretch = 1;
    double mnYStretch = 1; // along the columns
    // What a step of one pixel of the result along its row is in the image, x and y, and what one along its column is.
    std::array<double, 4> moFootprint = {1, 0, 0, 1};
    // Cubic and lanczos keep to the range of the pixels that they reach, those where the kernel crosses zero too.
    bool mbClamp = true;
};

// The part of the image that is at hand: every pixel of the image that can have a part in the result. What lies outside
// counts as not valid.
// Borrowed for the call.
struct InterpolationWindow
{
    long long mnX = 0;                       // of its first pixel, in the image
    long long mnY = 0;                       // see mnX
    std::size_t mnWidth = 0;                 // pixels
    std::size_t mnHeight = 0;                // rows
    const unsigned char* mpPixels = nullptr; // interleaved, without padding; PADDING readable bytes follow the last one
    const unsigned char* mpValid = nullptr;  // a byte per value, 1 when it is valid and else 0; null: all are

    static constexpr std::size_t PADDING = 64;
};

// Makes pixels of a type and count of channels. A value is valid when the valid pixels of its channel have at least
// half of the weight (kernels), or when there is one (the others); it is made of the valid ones alone. Integers are
// rounded half to even and saturated, complex values weighed part by part. A result does not depend on those that are
// made with it. Any thread.
// The order of the virtual operations is fixed. Where all pixels of a window are valid a quicker way is taken, with the
// same results.
class KRV_GOBS_API IInterpolator
{
public:
    virtual ~IInterpolator();

    // The pixels at nCount places, NaN for none. pPixels: interleaved. True when all values are valid; otherwise pValid
    // gets a byte per value, 1 when it is valid, else 0, and then the value means nothing.
    // pPixels: nCount pixels of all channels; pValid: nCount * channels bytes, untouched when the answer is true.
    virtual bool Run(const InterpolationWindow& oWindow, const double* pX, const double* pY, std::size_t nCount,
                     unsigned char* pPixels, unsigned char* pValid) const = 0;
};

// Throws ParameterException for a rule that makes no sense, DataException for one-bit values and a type outside the
// table.
// nChannels: of the window's pixels and of the result's. Made once for an image.
KRV_GOBS_API std::unique_ptr<IInterpolator> MakeInterpolator(const DataType& oType, unsigned int nChannels,
                                                             const InterpolationRule& oRule);

// How far from a place, in pixels, those lie that have a part in it, on either side.
// In x and y. A window that holds these pixels around every place is enough.
KRV_GOBS_API std::array<double, 2> GetReach(const InterpolationRule& oRule);

} // namespace krv::gobs
