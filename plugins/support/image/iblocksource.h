#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/image/imagelayout.h"

#include <cstddef>
#include <memory>
#include <string>

namespace krv::plugins::support
{

// A block of one plane.
// All count from 0; planes are those of the layout.
struct BlockAddress
{
    unsigned int mnPlane = 0;
    unsigned int mnColumn = 0; // of blocks, from the left
    unsigned int mnRow = 0;    // of blocks, from the top
};

// Where the pixels of an image come from, so that datasets which read the same share what they decoded.
// Two sources of equal origins give the same pixels for the same block.
struct BlockOrigin
{
    // All pixels come from this file alone, and depend on nothing but what it held when it was opened. Null: nobody
    // shares.
    std::shared_ptr<const File> mpoFile;
    // The format, which of the images in the file, and each option by which the format would hand out other pixels.
    std::string moImage;
};

// What a format knows of one image: its layout and how a block is read. Everything else (windows, clipping, caching,
// interleaving, checks of arguments) is the base's. Values go in and out in this machine's byte order, a plane's
// channels pixel interleaved. One thread at a time.
// Example: a format of plain rows has PlainSource; one of compressed tiles overrides GetLayout, ReadBlock and GetName.
class IBlockSource
{
public:
    virtual ~IBlockSource();

    // Size, blocks, channels and type. It belongs to the source.
    virtual const ImageLayout& GetLayout() const = 0;

    // Reads a part of a block. oPart counts from the block's own corner and lies inside the block and the image. Row r
    // of the part goes to pTarget + r * nPitch; bytes between the rows stay untouched. Throws krv::FileException kinds
    // that name the file. When ReadsParts and SparesParts are false the part is always all of the block that lies in
    // the image.
    virtual void ReadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned char* pTarget,
                           std::size_t nPitch) = 0;

    // Whether a part costs about as much as its own rows, so that reading it again is cheaper than keeping blocks.
    virtual bool ReadsParts() const { return false; }

    // Whether a part can be read even when all of its block cannot, since damage elsewhere in the block does not touch
    // it: ReadBlock is then asked for the part alone after it failed for the block.
    virtual bool SparesParts() const { return false; }

    // The counterpart of ReadBlock for any part. Unless overridden it throws DataException: the format is read only.
    // oPart: as for ReadBlock, but any part of the block inside the image. pSource is not kept. What is stored is read
    // back.
    virtual void WriteBlock(const BlockAddress& oBlock, const PixelRect& oPart, const unsigned char* pSource,
                            std::size_t nPitch);

    // The name of the file, for messages.
    // As users know it.
    virtual std::string GetName() const = 0;

    // Unless overridden nobody shares the decoded blocks.
    // Asked once, when the image is made.
    virtual BlockOrigin GetOrigin() const;

    // Said before ReadBlock: the nBlocks blocks from oFirst on, to the right, are wanted next, all or some of them.
    // What is stored side by side can then be read with one call.
    // A hint: nothing has to be done.
    virtual void Expect(const BlockAddress& oFirst, unsigned int nBlocks);
    // The same of blocks that are likely to be wanted later.
    virtual void Foresee(const BlockAddress& oFirst, unsigned int nBlocks);
};

} // namespace krv::plugins::support
