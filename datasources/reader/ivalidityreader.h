#pragma once

#include "datasources/api.h"

#include <memory>

namespace krv::gobs
{
class Mask;
class Raster;
} // namespace krv::gobs

namespace krv::datasources
{

// A facet of readers that know themselves which of their pixels hold data: those that make pixels of other ones, which
// no record of a dataset describes. Found by dynamic_cast; ReaderValidity asks any reader. The order of the virtual
// operations is public and fixed.
// Programs ask ReaderValidity; authors of readers that make pixels give this.
class KRV_DATASOURCES_API IValidityReader
{
public:
    virtual ~IValidityReader();

    // Whether there is anything that could make a pixel of the image invalid.
    virtual bool HasValidity() = 0;
    // Fills a raster as ReadRaster does, and gives a new mask over its full extent whose set bits are valid pixels, or
    // null when all pixels of the image are.
    // Margins that are copies of pixels are as valid as these; others outside the image are not.
    virtual std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) = 0;
};

} // namespace krv::datasources
