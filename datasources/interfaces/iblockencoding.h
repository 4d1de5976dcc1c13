#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/iencodedblocks.h"

#include <cstddef>
#include <vector>

namespace krv::datasources
{

// Makes the bytes of blocks from their pixels, without a look at the file. One thread at a time, any thread; others may
// use encoders of their own for the same image meanwhile. The order of the virtual operations is public and fixed.
// Keeps its working memory from block to block; destroyed by any thread, after the dataset too.
class KRV_DATASOURCES_API IBlockEncoder
{
public:
    virtual ~IBlockEncoder();

    // pPixels: what of the block lies in the image, in the type and with the channels of its plane as the raster I/O
    // takes them; nPitch: bytes from one row to the next. oBytes gets what StoreEncoded of IEncodedBlocks takes. Throws
    // DataException for a block outside the grid, and what the codec throws.
    virtual void Encode(const BlockNumber& oBlock, const unsigned char* pPixels, std::size_t nPitch,
                        std::vector<unsigned char>& oBytes) = 0;
};

// Encoding apart from storing: a facet of datasets that have IEncodedBlocks too, found by dynamic_cast. So blocks can
// be encoded on all cores while one thread stores them. The order of the virtual operations is public and fixed.
// SplitWriter uses both facets; programs that write rasters need neither.
class KRV_DATASOURCES_API IBlockEncoding
{
public:
    virtual ~IBlockEncoding();

    // A new encoder for the blocks of the image (level 1) or of a level as they are laid out, owned by the caller. It
    // takes what it needs with it and is of no more use when these are laid out anew. Null when blocks cannot be
    // encoded one without the other, or not at all: pixels are written by the raster I/O then, or not either. To be
    // called by the dataset's own thread. Throws DataException for a level that does not exist.
    virtual IBlockEncoder* MakeBlockEncoder(unsigned int nLevel) = 0;
};

} // namespace krv::datasources
