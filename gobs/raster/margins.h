#pragma once

#include "gobs/api.h"
#include "toolkit/exceptions/place.h"

#include <cstdint>

// How pixels outside the image are made. k is an index outside 0..n-1 of a line of n pixels. At global scope, intended:
// the reader's interfaces name it so.
enum eMarginBehaviour
{
    eException = 0, // none are made: reading them is an error
    eReplicate = 1, // the nearest pixel: min(max(k, 0), n-1)
    eMirror = 2,    // mirrored, the edge pixel repeated; the readers' default
    eMirror101 = 3, // mirrored, the edge pixel not repeated
    eConstant = 4,  // a value, 0 unless somebody says otherwise
    eNoData = 5,    // the channel's no-data value; only the exact-halo reader serves it
    eWrap = 6       // the other end of the line: k mod n
};

namespace krv::gobs
{

class Raster;

// The sides of a raster whose margins FillRasterMargins makes.
// Bits, to be joined.
enum eMarginSide : unsigned int
{
    eRightSide = 1,
    eLeftSide = 2,
    eTopSide = 4,
    eBottomSide = 8
};

// Fills the margins of the flagged sides from the pixels of the others. The valid pixels are the full extent without
// the margin of each flagged side; every other pixel takes the one that the behaviour names, columns and rows
// independently, folded as often as it needs. A flagged side of margin 0 changes nothing. Values of any size, one-bit
// rasters included. Throws ParameterException for eException, eNoData and unknown behaviours, and when no valid pixel
// is left.
// poRaster: the caller's, not null; its centre, or more of it, holds pixels.
KRV_GOBS_API void FillRasterMargins(Raster* const poRaster, eMarginBehaviour eBehaviour, unsigned int nSides);

// The same for so many columns and rows on each side, whatever the margins of the raster are.
// nLeft, nRight: columns; nTop, nBottom: rows, of the full extent. Throws as FillRasterMargins.
KRV_GOBS_API void FillRasterSides(Raster& oRaster, eMarginBehaviour eBehaviour, std::uint64_t nLeft,
                                  std::uint64_t nRight, std::uint64_t nTop, std::uint64_t nBottom,
                                  const krv::Place& oPlace = krv::Place::Current());

// The index that stands for `nIndex` on a line of `nLength` > 0 pixels under a behaviour that copies pixels
// (eReplicate, eMirror, eMirror101, eWrap). Throws ParameterException for the others.
// Example for 4 pixels and index -1: eReplicate 0, eMirror 0, eMirror101 1, eWrap 3.
KRV_GOBS_API long long FoldIndex(long long nIndex, long long nLength, eMarginBehaviour eBehaviour);

} // namespace krv::gobs
