#pragma once

#include "datasources/api.h"
#include "gobs/mask/maskdecision.h"

#include <cstddef>
#include <memory>

namespace krv::gobs
{
class IMaskBuilder;
class Mask;
class Raster;
} // namespace krv::gobs

namespace krv::datasources
{

class IRasterReader;
class IValidityReader;
class ValiditySource;

// Reads the rasters of any reader with the validity of their pixels: by the reader's own word when it has
// IValidityReader, else by all that the dataset behind it says (ValiditySource), of a level too, else by its record
// alone. Where any channel's no-data value makes a pixel invalid, the record counts beside the reader's own word, which
// is of all channels. One thread at a time.
// Example: ReaderValidity oValidity(oReader); const auto poValid = oValidity.Read(*poTile); a null poValid: all are
// valid.
class KRV_DATASOURCES_API ReaderValidity
{
public:
    // The reader is borrowed and outlives this. The rule counts where no-data values of channels decide. Throws what
    // ValiditySource throws.
    explicit ReaderValidity(IRasterReader& oReader, krv::gobs::BkgdRule eRule = krv::gobs::eAllChannels);
    ~ReaderValidity();
    ReaderValidity(const ReaderValidity&) = delete;
    ReaderValidity& operator=(const ReaderValidity&) = delete;

    // Whether any pixel of the image could be invalid.
    bool IsNeeded() const { return mbNeeded; }
    // Whether nothing but the values of the pixels themselves says so, by the record of their dataset.
    bool IsByValues() const;
    // What marks the pixels that the mask of a channel alone says to be background, by its position in the rasters,
    // from 0; null when it has none. It goes with this.
    const krv::gobs::IMaskBuilder* GetChannelMask(std::size_t nPosition) const;
    // Fills the raster, and gives a new mask over its full extent whose set bits are valid pixels; null, which means
    // all pixels of the image, when it is not needed.
    // Throws what reading pixels, mask and alpha throws. The mask is the caller's and stands on nothing.
    std::unique_ptr<krv::gobs::Mask> Read(krv::gobs::Raster& oRaster);

private:
    IRasterReader& moReader;
    IValidityReader* mpoFacet;                 // of the reader, or null
    std::unique_ptr<ValiditySource> mpoSource; // where there is no facet, or beside it
    bool mbNeeded;
};

} // namespace krv::datasources
