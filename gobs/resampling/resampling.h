#pragma once

#include "gobs/api.h"

#include <string>

namespace krv::gobs
{

// How the pixels of a level are made from those of the image. A level of factor f has the size ceil(width / f) by
// ceil(height / f); pixel i stands for the box [i * f, min((i + 1) * f, size)) on each axis. Integers are rounded half
// to even. Samples that are not valid take no part.
// For classes and indices take eNearest or eMode: the mean of two classes is none.
enum class Resampling
{
    eNearest,  // the source pixel floor((i + 0.5) * f)
    eAverage,  // the mean of the box; of complex values the mean of both parts
    eMode,     // the most frequent value of the box, of several the smallest
    eBilinear, // kernels stretched by f around (i + 0.5) * f - 0.5, of the weights of valid pixels inside the image;
    eCubic,    // cubic (Keys, -0.5) and lanczos (3 lobes) keep to the range of the pixels that they reach. Complex
    eLanczos,  // values are weighed part by part
    eRms,      // the root of the mean square of the box; of complex values as eAverage of power
    eMin,      // the smallest value of the box, NaN only when there is no other; of complex values that of the
    eMax       // smallest, the largest magnitude
};

// NEAREST, AVERAGE, MODE, BILINEAR, CUBIC, LANCZOS, RMS, MIN, MAX in any letter case; else ParameterException.
// Any thread. Blanks are not cut off.
KRV_GOBS_API Resampling ParseResampling(const std::string& name);
// The name in capitals.
// As ParseResampling takes it and as files record it.
KRV_GOBS_API std::string GetResamplingName(Resampling eMethod);

// Pixels of the level beyond those whose boxes are touched that a changed pixel
// of the image has a part in.
// 0 for methods of the box.
KRV_GOBS_API unsigned int GetKernelRadius(Resampling eMethod);

} // namespace krv::gobs
