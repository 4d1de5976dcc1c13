#pragma once

#include "plugins/support/image/blockcache.h"
#include "plugins/support/image/iblocksource.h"
#include "toolkit/cache/tilestore.h"

#include <memory>

namespace krv::plugins::support
{

// The decoded blocks of an image in the process's store. Those of images of one origin are shared as long as the file
// is as it was when it was opened; who finds it changed goes on alone. One thread at a time.
// Used by BlockImage. Memory is the store's, within the process's budget.
class BlockTiles
{
public:
    // The source outlives it. oCache says whether blocks are shared.
    BlockTiles(IBlockSource& oSource, const BlockCache& oCache);

    using Wait = krv::cache::TileOwner::Wait;

    // What of a block stays when all of it has to make room: columns at both sides, and rows.
    // In pixels; 0: nothing of that side.
    struct Border
    {
        unsigned int mnColumns = 0; // left and right, each
        unsigned int mnTop = 0;
        unsigned int mnBottom = 0;
    };

    // A part of a block that is there, or is being decoded by somebody else, or nothing.
    // Empty when there is nothing. The hold keeps the block in memory: let it go soon.
    krv::cache::TileHold Find(const BlockAddress& oBlock, const PixelRect& oPart) const;

    // A part of a block, which is decoded if it is not there. Nothing only when somebody else decodes it and eWait says
    // not to wait. oBefore: called before the block is decoded here. Throws what the source throws, for whomever.
    // oPart: counted from the block's own corner, inside the part of it that lies in the image.
    template <typename Before>
    krv::cache::TileHold Load(const BlockAddress& oBlock, const PixelRect& oPart, const Border& oBorder, Wait eWait,
                              const Before& oBefore)
    {
        krv::cache::TileLook oLook = mpoOwner->Look(MakeRequest(oBlock, oPart, oBorder), eWait);
        if (!oLook.moClaim)
            return std::move(oLook.moHold);
        return Decode(oBlock, oPart, oLook.moClaim, oBefore);
    }

    // The block is not wanted again, but for nRows rows at its bottom.
    // A block that is not there is no error.
    void Retire(const BlockAddress& oBlock, unsigned int nRows) const;

    // Of every owner of the same origin.
    void Drop(const BlockAddress& oBlock) const;
    void DropAll() const;

private:
    template <typename Before>
    krv::cache::TileHold Decode(const BlockAddress& oBlock, const PixelRect& oPart, krv::cache::TileClaim& oClaim,
                                const Before& oBefore)
    {
        try
        {
            oBefore();
            Fill(oBlock, oClaim.GetBytes());
        }
        catch (...)
        {
            oClaim.Fail(std::current_exception());
            throw;
        }
        return Publish(oBlock, oPart, oClaim);
    }

    krv::cache::TileName GetName(const BlockAddress& oBlock) const
    {
        return {moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow), oBlock.mnPlane};
    }
    krv::cache::TileArea GetArea(const BlockAddress& oBlock, const PixelRect& oPart) const;
    krv::cache::TileRequest MakeRequest(const BlockAddress& oBlock, const PixelRect& oPart,
                                        const Border& oBorder) const;
    void Fill(const BlockAddress& oBlock, unsigned char* pTarget);
    krv::cache::TileHold Publish(const BlockAddress& oBlock, const PixelRect& oPart, krv::cache::TileClaim& oClaim);

    IBlockSource& moSource;                          // borrowed
    const ImageLayout& moLayout;                     // the source's
    std::shared_ptr<const File> mpoFile;             // null: not shared
    std::unique_ptr<krv::cache::TileOwner> mpoOwner; // never null
};

} // namespace krv::plugins::support
