#pragma once

#include "gobs/api.h"
#include "gobs/mask/samplevalue.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/datatype.h"

#include <cstddef>
#include <memory>
#include <optional>

namespace krv::gobs
{

// Gives the values of a channel their colours of a table, in 8 bits per part: red, green, blue and, on request, alpha,
// side by side. Values of one and two bytes are looked up in a list of all of them, made once. Any thread.
class KRV_GOBS_API ColourMapper
{
public:
    // oTransparent: a value whose alpha is 0, whatever the table says. The table is not kept. Throws DataException for
    // a complex type, one-bit values and a type outside the table of types.
    // Types of more than two bytes are looked up value by value.
    ColourMapper(const PCT& oTable, const DataType& oType, bool bAlpha,
                 const std::optional<SampleValue>& oTransparent = std::nullopt);
    ~ColourMapper();

    // Any number of values; colours of 3 bytes, or 4 with alpha. The buffers do not overlap.
    // pValues: nValues values of the type, nothing need be aligned; pColours: every byte is written.
    void Run(const unsigned char* pValues, std::size_t nValues, unsigned char* pColours) const;

    // How it is done; private to the library.
    class Implementation;

private:
    std::unique_ptr<const Implementation> mpoImplementation;
};

} // namespace krv::gobs
