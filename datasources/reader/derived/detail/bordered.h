#pragma once

#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/readervalidity.h"

namespace krv::datasources::detail
{

// The margins of a reader that itself makes windows inside its image alone: its pixels, and their validity, extended
// beyond the borders. The reader is borrowed; it asks this for rasters that reach outside.
class Bordered
{
public:
    explicit Bordered(IRasterReader& oReader);
    ~Bordered();

    // Whether a raster with its margins lies in the image.
    static bool IsInside(const IRasterReader& oReader, const krv::gobs::Raster& oRaster);
    // Throws ParameterException for an unknown behaviour.
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour);
    void Read(krv::gobs::Raster& oRaster);
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster);

private:
    class ValidityChannel;

    IRasterReader& moReader;
    ExactHaloReader moPixels;
    std::unique_ptr<ValidityChannel> mpoChannel;
    std::unique_ptr<ExactHaloReader> mpoValidity;
};

} // namespace krv::datasources::detail
