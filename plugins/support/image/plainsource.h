#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/image/blockimage.h"
#include "plugins/support/image/iblocksource.h"

#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// Pixels that lie plain in a file: rows top to bottom, each plane at an offset and with a pitch of its own, values in
// one byte order. Blocks are mere rectangles of it. Several channels are read and written in one go as well, whichever
// way they lie, without blocks.
// Reading needs no memory but some slices for values in the other order and for planes that are interleaved.
class PlainSource : public IBlockSource
{
public:
    // Where a plane lies: its first value, and the bytes from row to row.
    // Example: line-interleaved rows of 3 channels of 100 pixels of 8 bits: offsets 0, 100 and 200, a pitch of 300.
    struct Placement
    {
        std::uint64_t mnOffset = 0;   // bytes from the beginning of the file
        std::uint64_t mnRowPitch = 0; // bytes, gaps between rows included
    };

    // The rows of one channel after those of the other (eBand), a row of each in turn (eLine).
    // Names of common headers: BSQ is eBand, BIL is eLine; BIP is one plane of all channels.
    enum class Order
    {
        eBand,
        eLine
    };

    // Planes without gaps, the first one at nOffset, in this machine's byte order. oBeforeWrite: called before each
    // change; throws when there must be none; without it the pixels are only read. Throws FileFormatException when the
    // file ends before the last pixel.
    PlainSource(std::shared_ptr<File> poFile, std::uint64_t nOffset, ImageLayout oLayout,
                std::function<void()> oBeforeWrite = {});
    // bSwap: the file has the other byte order.
    PlainSource(std::shared_ptr<File> poFile, std::vector<Placement> oPlacements, bool bSwap, ImageLayout oLayout,
                std::function<void()> oBeforeWrite = {});
    ~PlainSource() override;

    // The bytes of all pixels without gaps. Throws DataException above 2^62.
    // What a new file of that layout takes behind its header.
    static std::uint64_t CountBytes(const ImageLayout& oLayout);
    // Planes without gaps; what no file can hold lies behind the end of any.
    static std::vector<Placement> PlacePlanes(const ImageLayout& oLayout, std::uint64_t nOffset, Order eOrder);

    // As the constructor got it.
    const ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoFile->GetName(); }

    // A part costs what its own bytes cost.
    bool ReadsParts() const override { return true; }

    // Throws IOException for what cannot be read; the file may have become shorter.
    void ReadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    void WriteBlock(const BlockAddress& oBlock, const PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;

    // A rectangle of the image, pixel interleaved in the order of the selection; row r lies at the pointer + r *
    // nPitch.
    // Quicker than blocks where several channels lie in planes of their own: each is read in long pieces.
    void Read(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch);
    void Write(const ChannelSelection& oChannels, const PixelRect& oRect, const unsigned char* pSource,
               std::size_t nPitch);

private:
    std::uint64_t GetOffset(unsigned int nPlane, unsigned int nX, unsigned int nY) const
    {
        const Placement& oPlacement = moPlacements[nPlane];
        return oPlacement.mnOffset + nY * oPlacement.mnRowPitch + nX * moLayout.GetPixelBytes(nPlane);
    }
    void CheckEnd() const;
    void ReadPlane(unsigned int nPlane, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch);
    void WritePlane(unsigned int nPlane, const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch);
    void ReadChosen(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                    std::size_t nPitch);
    bool ReadSpan(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                  std::size_t nPitch);
    void ReadPlanes(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                    std::size_t nPitch);
    // Planes that were read into pixels.
    void Interleave(const ChannelSelection& oChannels, const std::vector<const unsigned char*>& oPlanes,
                    std::size_t nPlanePitch, const PixelRect& oSlice, unsigned char* pTarget, std::size_t nPitch) const;
    void WriteChosen(const ChannelSelection& oChannels, const PixelRect& oRect, const unsigned char* pSource,
                     std::size_t nPitch);
    // The values of rows in the other byte order, in place.
    void Swap(unsigned int nPlane, unsigned char* pRows, std::size_t nPitch, std::size_t nRowBytes,
              std::size_t nRows) const;

    std::shared_ptr<File> mpoFile;
    ImageLayout moLayout;
    std::function<void()> moBeforeWrite;
    std::vector<Placement> moPlacements; // one for each plane
    bool mbSwap = false;                 // the file has the other byte order
    Scratch moScratch;
    Scratch moPlanes; // rows of planes, before they are interleaved
};

// Windows over it, without a cache: the system has one of the file, which all readers share, and rows cost as much to
// copy from there as from a store of ours, which would hold the same bytes once more.
// Made by formats for their IRasterIO in place of BlockRasterIO.
class PlainIO : public krv::datasources::WindowedIO<krv::datasources::IRasterIO>
{
public:
    // poSource: shared with the dataset. Throws as ChannelSelection.
    PlainIO(std::shared_ptr<PlainSource> poSource, const std::vector<unsigned int>& oChannels,
            const Place& oPlace = Place::Current());
    ~PlainIO() override;

    unsigned int GetFileWidth() const override { return mpoSource->GetLayout().GetWidth(); }
    unsigned int GetFileHeight() const override { return mpoSource->GetLayout().GetHeight(); }
    unsigned int GetTileWidth() const override { return mpoSource->GetLayout().GetPreferredWidth(); }
    // Rows of about a mebibyte of all channels together, and not so few that margins would be most of what is read.
    unsigned int GetTileHeight() const override;

private:
    std::size_t GetPixelBytes() const override { return moChannels.GetPixelBytes(); }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;

    std::shared_ptr<PlainSource> mpoSource;
    ChannelSelection moChannels;
};

} // namespace krv::plugins::support
