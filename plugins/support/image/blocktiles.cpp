#include "plugins/support/image/blocktiles.h"

#include <algorithm>

namespace krv::plugins::support
{

namespace
{

// All that decides how many bytes a block has and what they mean.
std::string Describe(const ImageLayout& oLayout)
{
    std::string text = std::to_string(oLayout.GetWidth()) + "x" + std::to_string(oLayout.GetHeight()) + " of " +
                       std::to_string(oLayout.GetBlockWidth()) + "x" + std::to_string(oLayout.GetBlockHeight());
    for (unsigned int nPlane = 0, nEqual = 0; nPlane < oLayout.GetPlaneCount(); nPlane += nEqual)
    {
        const Plane& oPlane = oLayout.GetPlane(nPlane);
        for (nEqual = 1; nPlane + nEqual < oLayout.GetPlaneCount(); ++nEqual)
            if (const Plane& oNext = oLayout.GetPlane(nPlane + nEqual);
                oNext.moType != oPlane.moType || oNext.mnChannels != oPlane.mnChannels)
                break;
        text +=
            ", " + std::to_string(nEqual) + " of " + std::to_string(oPlane.mnChannels) + " " + oPlane.moType.Describe();
    }
    return text;
}

} // namespace

// What the source knows by now it read after the file was opened: if the file is still the same it is of that state.
BlockTiles::BlockTiles(IBlockSource& oSource, const BlockCache& oCache)
    : moSource(oSource), moLayout(oSource.GetLayout())
{
    BlockOrigin oOrigin = oCache.IsShared() ? oSource.GetOrigin() : BlockOrigin();
    if (oOrigin.mpoFile && oOrigin.mpoFile->IsAsOpened())
    {
        mpoFile = std::move(oOrigin.mpoFile);
        mpoOwner = std::make_unique<krv::cache::TileOwner>(mpoFile->GetStamp()->GetText() + oOrigin.moImage + " " +
                                                           Describe(moLayout));
    }
    else
        mpoOwner = std::make_unique<krv::cache::TileOwner>();
}

krv::cache::TileArea BlockTiles::GetArea(const BlockAddress& oBlock, const PixelRect& oPart) const
{
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    return {oPart.mnX * nPixelBytes, oPart.mnY, oPart.mnWidth * nPixelBytes, oPart.mnHeight};
}

krv::cache::TileRequest BlockTiles::MakeRequest(const BlockAddress& oBlock, const PixelRect& oPart,
                                                const Border& oBorder) const
{
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    const std::size_t nColumns = std::min(oBorder.mnColumns, oRect.mnWidth) * nPixelBytes;
    return {GetName(oBlock),
            {oRect.mnWidth * nPixelBytes, oRect.mnHeight},
            GetArea(oBlock, oPart),
            {nColumns, std::min(oBorder.mnTop, oRect.mnHeight), nColumns, std::min(oBorder.mnBottom, oRect.mnHeight)}};
}

krv::cache::TileHold BlockTiles::Find(const BlockAddress& oBlock, const PixelRect& oPart) const
{
    return mpoOwner->IsEmpty() ? krv::cache::TileHold() : mpoOwner->Find(MakeRequest(oBlock, oPart, {}));
}

void BlockTiles::Fill(const BlockAddress& oBlock, unsigned char* pTarget)
{
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    moSource.ReadBlock(oBlock, {0, 0, oRect.mnWidth, oRect.mnHeight}, pTarget,
                       oRect.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane));
}

// A file that changed under its readers may have given anything: nobody else gets that.
krv::cache::TileHold BlockTiles::Publish(const BlockAddress& oBlock, const PixelRect& oPart,
                                         krv::cache::TileClaim& oClaim)
{
    const krv::cache::TileArea oArea = GetArea(oBlock, oPart);
    if (!mpoFile || mpoFile->IsAsOpened())
        return oClaim.Publish(oArea);
    krv::cache::TileHold oHold = oClaim.Withhold(oArea);
    mpoOwner = std::make_unique<krv::cache::TileOwner>();
    mpoFile.reset();
    return oHold;
}

void BlockTiles::Retire(const BlockAddress& oBlock, unsigned int nRows) const
{
    mpoOwner->Retire(GetName(oBlock), {0, 0, 0, nRows});
}

void BlockTiles::Drop(const BlockAddress& oBlock) const
{
    mpoOwner->Drop(GetName(oBlock));
}

void BlockTiles::DropAll() const
{
    mpoOwner->DropAll();
}

} // namespace krv::plugins::support
