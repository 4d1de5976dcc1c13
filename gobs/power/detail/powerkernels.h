#pragma once

#include "gobs/power/powersum.h"

#include <cstddef>

namespace krv::gobs::detail
{

enum class PowerForm
{
    eSquares, // all squares weigh 1, and all values 0
    eValues,  // the other way round
    eWeighted
};

// Pixels of mnSamples samples each (complex values count twice), of which sample n adds mpSquares[n] * x^2 and
// mpValues[n] * x to the power.
struct PowerJob
{
    const unsigned char* mpPixels;
    std::size_t mnPixels;
    std::size_t mnSamples;
    const double* mpSquares;
    const double* mpValues;
    PowerForm meForm;
    unsigned char* mpPower;
};

using PowerLoop = void (*)(const PowerJob& oJob);

// The loop for this processor, by the type of the samples: that of one part of complex values.
PowerLoop FindPowerLoop(NativeDataTypeCode ePart);

// The same, compiled for one instruction set.
PowerLoop FindBaselinePowerLoop(NativeDataTypeCode ePart);
PowerLoop FindAvx2PowerLoop(NativeDataTypeCode ePart);
PowerLoop FindAvx512PowerLoop(NativeDataTypeCode ePart);

} // namespace krv::gobs::detail
