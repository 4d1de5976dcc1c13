#pragma once

#include "datasources/interfaces/windowedio.h"
#include "gobs/raster/datatype.h"
#include "toolkit/exceptions/place.h"

#include <cstddef>
#include <cstdint>
#include <vector>

namespace krv::plugins::support
{

// Channels that a block holds together, pixel interleaved, all of one type. Pixel-interleaved files have one plane of
// all channels, band-interleaved ones a plane for every channel.
// A plain value. Example: three channels of 12 bits in 16: {eDT_16U, 3}.
struct Plane
{
    // The type of the values that are handed out: one of the table, in this machine's byte order.
    krv::gobs::DataType moType;
    unsigned int mnChannels = 1; // of a pixel in its blocks
    // The type as the file stores it; no type (the default) means the same.
    krv::gobs::DataType moNativeType;
};

using krv::datasources::PixelRect;

// Where a channel lies: its plane, and its position among the plane's channels, both from 0.
struct ChannelPlace
{
    unsigned int mnPlane = 0;
    unsigned int mnPosition = 0; // among the values of a pixel

    friend bool operator==(const ChannelPlace&, const ChannelPlace&) = default;
};

// The geometry of an image: its size, the grid of its blocks, which is the same for all planes, and its planes. Blocks
// count from 0, row by row; those at the right and bottom edge may reach beyond the image.
// A plain value. Example, band interleaved: ImageLayout(width, height, 256, 256, {{eDT_8U}, {eDT_8U}, {eDT_8U}}).
class ImageLayout
{
public:
    // No planes: an image without channels. Throws DataException for a size of 0 or above 2^31 - 1, and for a type
    // outside the table.
    ImageLayout(unsigned int nWidth, unsigned int nHeight, unsigned int nBlockWidth, unsigned int nBlockHeight,
                std::vector<Plane> oPlanes, const Place& oPlace = Place::Current());

    unsigned int GetWidth() const { return mnWidth; }
    unsigned int GetHeight() const { return mnHeight; }

    // Pixels of a whole block.
    unsigned int GetBlockWidth() const { return mnBlockWidth; }
    unsigned int GetBlockHeight() const { return mnBlockHeight; }
    unsigned int GetBlocksAcross() const { return mnBlocksAcross; }
    unsigned int GetBlocksDown() const { return (mnHeight - 1) / mnBlockHeight + 1; }

    // The size that readers are told to use; the block's unless set.
    // Where a multiple of the block is quicker to read than one: a whole row of small strips.
    void SetPreferredBlock(unsigned int nWidth, unsigned int nHeight);
    unsigned int GetPreferredWidth() const { return mnPreferredWidth; }
    unsigned int GetPreferredHeight() const { return mnPreferredHeight; }

    unsigned int GetPlaneCount() const { return static_cast<unsigned int>(moPlanes.size()); }

    // nPlane: from 0, not checked. Lives as long as the layout.
    const Plane& GetPlane(unsigned int nPlane) const { return moPlanes[nPlane]; }

    // Of all planes together.
    unsigned int GetChannelCount() const { return moFirstChannels.back(); }

    // A channel counts from 1. Throw DataException for one that does not exist.
    ChannelPlace GetChannelPlace(unsigned int nChannel, const Place& oPlace = Place::Current()) const;
    const Plane& GetChannelPlane(unsigned int nChannel, const Place& oPlace = Place::Current()) const;

    // Bytes of one value, and of all values of one pixel of a plane, as handed out.
    static std::size_t GetValueBytes(const krv::gobs::DataType& oType) { return oType.GetValueBits() / 8; }
    std::size_t GetPixelBytes(unsigned int nPlane) const { return moPixelBytes[nPlane]; }

    // The part of a block that lies in the image, in image coordinates.
    // Counted from 0, inside the grid; this is not checked.
    PixelRect GetBlockRect(unsigned int nColumn, unsigned int nRow) const;

    // From 0 within a plane; 64 bits, since a file may claim any size.
    std::uint64_t GetBlockIndex(unsigned int nColumn, unsigned int nRow) const
    {
        return static_cast<std::uint64_t>(nRow) * mnBlocksAcross + nColumn;
    }

private:
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnBlockWidth; // pixels, at least 1
    unsigned int mnBlockHeight;
    unsigned int mnPreferredWidth;
    unsigned int mnPreferredHeight;
    unsigned int mnBlocksAcross; // in a row of blocks
    std::vector<Plane> moPlanes;
    std::vector<unsigned int> moFirstChannels; // of each plane, and the count of all at the end
    std::vector<std::size_t> moPixelBytes;     // of each plane
};

} // namespace krv::plugins::support
