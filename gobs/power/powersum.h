#pragma once

#include "gobs/api.h"
#include "gobs/raster/datatype.h"

#include <cstddef>
#include <memory>
#include <vector>

namespace krv::gobs
{

// How a channel of an image has part in the power of a pixel.
// Example: channels S11, S12, S22 of a scene with equal S12 and S21: weights 1, 2, 1, all eSquare.
struct PowerTerm
{
    enum Kind
    {
        eNone = 0,
        eSquare = 1, // the square of the magnitude: re^2 + im^2 of complex values, x^2 of real ones
        eValue = 2   // the value itself, the real part of complex ones
    };

    Kind meKind = eNone;
    double mnWeight = 1; // any number; 0 leaves the channel out
};

// Adds up the power of pixels: the sum over the channels of weight * square, or weight * value, in doubles, stored
// rounded once. In one pass, without a copy of the samples. Any thread.
class KRV_GOBS_API PowerSum
{
public:
    // One term for each channel of the pixels. The result is 64R when the parts of the type are 64R or integers of 32
    // or 64 bits, else 32R. Throws DataException for one-bit values and a type outside the table.
    // oTerms: as many as the pixels have channels; copied.
    PowerSum(const DataType& oType, const std::vector<PowerTerm>& oTerms);
    ~PowerSum();

    const DataType& GetResultType() const;

    // Interleaved pixels with as many channels as there are terms; one value of the result's type for each. The buffers
    // are aligned for their types and do not overlap.
    // pPower: nPixels values of 4 or 8 bytes, as GetResultType says.
    void Run(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pPower) const;

    // For buffers that are made before the sum is.
    static DataType ResultTypeOf(const DataType& oType);

private:
    struct State;
    std::unique_ptr<const State> mpoState;
};

} // namespace krv::gobs
