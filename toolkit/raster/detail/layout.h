#pragma once

#include "toolkit/exceptions/place.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/detail/kernels.h"

namespace krv::raster::detail
{

// A buffer type as a part type (an index of PartTypes) and a number of parts.
struct Layout
{
    std::size_t mnPart;
    std::size_t mnParts;

    std::size_t PartBytes() const { return PART_BYTES[mnPart]; }
    std::size_t ValueBytes() const { return PartBytes() * mnParts; }
    bool IsComplex() const { return mnParts == 2; }
};

// Throws ParameterException for a type that does not exist.
Layout LayoutOf(BufferType eType, const char* sParameter, const Place& oPlace);

// Whether every value of one part type has an exact counterpart in another.
bool PartCovers(std::size_t nPart, std::size_t nOther);

// Whether values of a shorter integer type become those of another by zeros for the bytes that are missing.
bool IsZeroExtended(std::size_t nPart, std::size_t nShorter);

} // namespace krv::raster::detail
