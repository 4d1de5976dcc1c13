#pragma once

#include "gobs/api.h"
#include "gobs/raster/rasterinfo.h"

#include <cstdint>

namespace krv::gobs
{

class Raster;

// One bit per pixel over the full extent of a raster, margins included: the bit of column c and row r of the full
// extent has the index i = r * full width + c and lies in byte i / 8 with the value 128 >> (i mod 8); rows are not
// padded. What a set bit means is the builder's to say.
// Example: how much of a tile's centre is valid: poMask->CountSetInCentre() of GetWidth() * GetHeight() pixels.
// One thread writes or several read. Not copied: masks are handed on as std::unique_ptr.
class KRV_GOBS_API Mask
{
public:
    // All bits clear. Only width and height of the description count.
    Mask(const RasterInfo& oInfo, const RasterContext& oContext);

    // The same with bits that have any value, for those who write every byte.
    struct NotCleared
    {
    };
    Mask(const RasterInfo& oInfo, const RasterContext& oContext, NotCleared);

    // Packs a byte per pixel of the full extent: any byte other than 0 sets the bit. With `bTakeOwnership` the buffer
    // came from HMalloc and is freed here, also when this throws; it is not kept in either case. Throws DataException
    // for a null buffer.
    Mask(const RasterInfo& oInfo, const RasterContext& oContext, unsigned char* pBytes, bool bTakeOwnership);

    ~Mask();
    Mask(const Mask&) = delete;
    Mask& operator=(const Mask&) = delete;

    // Of the centre, without margins; so is the height.
    unsigned int GetWidth() const { return mnWidth; }
    unsigned int GetHeight() const { return mnHeight; }
    const RasterContext& GetContext() const { return moContext; }
    int GetX() const { return moContext.GetX(); }
    int GetY() const { return moContext.GetY(); }
    unsigned int GetXMargin() const { return moContext.GetXMargin(); }
    unsigned int GetYMargin() const { return moContext.GetYMargin(); }
    std::uint64_t GetFullWidth() const { return mnWidth + 2ull * GetXMargin(); }
    std::uint64_t GetFullHeight() const { return mnHeight + 2ull * GetYMargin(); }

    // The packed bits, GetBitsSize() bytes; spare bits of the last byte are clear.
    // The mask owns them. Whoever writes bytes leaves the spare bits clear.
    unsigned char* GetBits() { return mpBits; }
    const unsigned char* GetBits() const { return mpBits; }

    // Bytes: a byte for eight pixels of the full extent, rounded up.
    std::uint64_t GetBitsSize() const { return mnBitsSize; }

    // Column and row of the full extent: (0, 0) is the first margin pixel. Not checked.
    // Constant time; for many pixels go over the bytes of GetBits.
    bool GetBit(std::uint64_t nColumn, std::uint64_t nRow) const;
    void SetBit(std::uint64_t nColumn, std::uint64_t nRow);

    // Leaves the bits that another mask of the same full extent has set too. Throws DataException for another extent.
    // Eight pixels at a time and more. Margins take part.
    void KeepCommon(const Mask& oOther);

    // Set bits in the whole full extent, and in the centre alone.
    std::uint64_t CountSet() const;

    // Pixels: 0 to width * height.
    std::uint64_t CountSetInCentre() const;

    // Writes the mask into a one-channel raster of the same full extent, of one-bit type (bits as here) or 8-bit
    // unsigned (1 for a set bit, else 0). Throws DataException for another type, channel count or extent.
    void RetrieveRaster(Raster& oRaster) const;

private:
    unsigned int mnWidth;
    unsigned int mnHeight;
    RasterContext moContext;
    std::uint64_t mnBitsSize; // bytes
    unsigned char* mpBits;    // owned, of HMalloc
};

} // namespace krv::gobs
