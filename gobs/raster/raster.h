#pragma once

#include "gobs/api.h"
#include "gobs/raster/rasterinfo.h"
#include "toolkit/core/hblock.h"
#include "toolkit/core/ownedorborrowed.h"

#include <cstdint>

namespace krv::gobs
{

// A rectangle of pixels with margins around it. The buffer covers (width + 2 * x margin) by (height + 2 * y margin)
// pixels, rows top to bottom, pixel interleaved without padding: the value of a channel of a pixel has the index
// ((row * full width) + column) * channels + channel. One-bit rasters are packed, most significant bit first.
// Buffers are 64-byte aligned; their contents are undefined until somebody fills them.
// Not copied: it is handed on as a std::unique_ptr. One thread writes or several read.
// Example: the first channel of the pixel in column c and row r of the centre of an 8U raster:
//   oRaster.GetBuffer()[((r + oRaster.GetYMargin()) * oRaster.GetFullWidth() + c + oRaster.GetXMargin()) * nChannels]
// RasterView says the same in fewer words and checks the type.
class KRV_GOBS_API Raster
{
public:
    // Allocates the buffer (HMalloc). Throws DataException when its size overflows, std::bad_alloc without memory.
    Raster(const RasterInfo& oInfo, const RasterContext& oContext);

    // Wraps a buffer of GetBufferSize() bytes. With `bTakeOwnership` the buffer came from HMalloc and goes to HFree
    // with the raster, or at once when this throws; otherwise it is the caller's and must live as long as the raster.
    // Throws DataException for a null buffer.
    Raster(const RasterInfo& oInfo, const RasterContext& oContext, unsigned char* pBuffer, bool bTakeOwnership);

    ~Raster();
    Raster(const Raster&) = delete;
    Raster& operator=(const Raster&) = delete;

    // The size is that of the centre; it lives as long as the raster.
    const RasterInfo& GetInfo() const { return moInfo; }
    const RasterContext& GetContext() const { return moContext; }
    unsigned int GetWidth() const { return moInfo.GetWidth(); }
    unsigned int GetHeight() const { return moInfo.GetHeight(); }
    unsigned int GetChansCount() const { return moInfo.GetChansCount(); }

    // Of every channel. It lives as long as the raster.
    const DataType& GetDataType() const { return moInfo.GetDataType(); }

    // In the image, of the centre's first pixel; negative when it lies before the image.
    int GetX() const { return moContext.GetX(); }
    int GetY() const { return moContext.GetY(); }
    unsigned int GetXMargin() const { return moContext.GetXMargin(); }
    unsigned int GetYMargin() const { return moContext.GetYMargin(); }

    // Margins included.
    std::uint64_t GetFullWidth() const { return GetWidth() + 2ull * GetXMargin(); }
    std::uint64_t GetFullHeight() const { return GetHeight() + 2ull * GetYMargin(); }
    // Bytes.
    std::uint64_t GetBufferSize() const { return mnBufferSize; }

    // The first byte of the top left pixel, that of the margin where there is one. The raster owns it, or borrows it.
    // Values lie in this machine's byte order, both parts of a complex one side by side, the real one first.
    unsigned char* GetBuffer() { return mpBuffer.get(); }
    const unsigned char* GetBuffer() const { return mpBuffer.get(); }

private:
    RasterInfo moInfo; // of the centre
    RasterContext moContext;
    std::uint64_t mnBufferSize; // bytes
    OwnedOrBorrowed<unsigned char, HBlockDeleter> mpBuffer;
};

} // namespace krv::gobs
