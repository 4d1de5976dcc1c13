#include "plugins/support/image/blockimage.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <string>

namespace krv::plugins::support
{

namespace
{

// Parts of sources that read parts are taken in slices of this size when the channels have to be picked out of them.
constexpr std::size_t SLICE_BYTES = 256 * 1024;
// So many bytes of planes are decoded beside each other before they are interleaved in one pass.
constexpr std::size_t PLANES_BYTES = std::size_t{32} << 20;
// Memory that stays with an image between windows.
constexpr std::size_t KEPT_SCRATCH_BYTES = std::size_t{4} << 20;
constexpr std::size_t ROW_CACHE_BYTES = std::size_t{64} << 10;
constexpr std::uint64_t LARGEST_KEPT_PART = std::uint64_t{16} << 20;
// Three blocks above a window and three below, and the two that are about to go.
constexpr std::uint64_t THIN_ENTRIES = 8;
constexpr int SHARING_LIMIT = 6;
constexpr int SHARING_THRESHOLD = 2;

bool Inside(const PixelRect& oInner, const PixelRect& oOuter)
{
    return oInner.mnX >= oOuter.mnX && oInner.mnY >= oOuter.mnY &&
           oInner.mnX + oInner.mnWidth <= oOuter.mnX + oOuter.mnWidth &&
           oInner.mnY + oInner.mnHeight <= oOuter.mnY + oOuter.mnHeight;
}

PixelRect Intersect(const PixelRect& oFirst, const PixelRect& oSecond)
{
    const unsigned int nX = std::max(oFirst.mnX, oSecond.mnX);
    const unsigned int nY = std::max(oFirst.mnY, oSecond.mnY);
    return {nX, nY, std::min(oFirst.mnX + oFirst.mnWidth, oSecond.mnX + oSecond.mnWidth) - nX,
            std::min(oFirst.mnY + oFirst.mnHeight, oSecond.mnY + oSecond.mnHeight) - nY};
}

} // namespace

ChannelSelection::ChannelSelection(const ImageLayout& oLayout, const std::vector<unsigned int>& oChannels,
                                   const Place& oPlace)
{
    if (oChannels.empty())
        throw DataException("The list of channels is empty", oPlace);
    moType = oLayout.GetChannelPlane(oChannels.front(), oPlace).moType;
    mnValueBytes = ImageLayout::GetValueBytes(moType);
    for (unsigned int nChannel : oChannels)
    {
        const Plane& oPlane = oLayout.GetChannelPlane(nChannel, oPlace);
        if (oPlane.moType != moType)
            throw DataException("Channel " + std::to_string(nChannel) + " is of type " + oPlane.moType.Describe() +
                                    ", channel " + std::to_string(oChannels.front()) + " of type " + moType.Describe() +
                                    "; they cannot be transferred together",
                                oPlace);
        moPlaces.push_back(oLayout.GetChannelPlace(nChannel, oPlace));
        moPositions.push_back(moPlaces.back().mnPosition);
        mbOnePlane = mbOnePlane && moPlaces.back().mnPlane == moPlaces.front().mnPlane;
        mbSinglePlanes = mbSinglePlanes && oPlane.mnChannels == 1;
    }
    mbWholePlane = mbOnePlane && moPlaces.size() == oLayout.GetPlane(moPlaces.front().mnPlane).mnChannels;
    for (std::size_t nAt = 0; mbWholePlane && nAt < moPositions.size(); ++nAt)
        mbWholePlane = moPositions[nAt] == nAt;
}

bool ChannelSelection::CoversPlane(unsigned int nPlane, unsigned int nPlaneChannels) const
{
    std::vector<bool> oCovered(nPlaneChannels, false);
    for (const ChannelPlace& oPlace : moPlaces)
        if (oPlace.mnPlane == nPlane)
            oCovered[oPlace.mnPosition] = true;
    return std::find(oCovered.begin(), oCovered.end(), false) == oCovered.end();
}

// The blocks that a rectangle touches.
struct BlockImage::Range
{
    unsigned int mnLeft;
    unsigned int mnTop;
    unsigned int mnRight; // inclusive
    unsigned int mnBottom;

    Range(const ImageLayout& oLayout, const PixelRect& oRect)
        : mnLeft(oRect.mnX / oLayout.GetBlockWidth()), mnTop(oRect.mnY / oLayout.GetBlockHeight()),
          mnRight((oRect.mnX + oRect.mnWidth - 1) / oLayout.GetBlockWidth()),
          mnBottom((oRect.mnY + oRect.mnHeight - 1) / oLayout.GetBlockHeight())
    {
    }
};

// Decoded pixels of one plane: pointer to the first one of a part, and the bytes from row to row.
struct BlockImage::Pixels
{
    const unsigned char* mpFirst = nullptr;
    std::size_t mnPitch = 0;
};

// One window on its way.
struct BlockImage::Job
{
    const ChannelSelection& moChannels;
    PixelRect moRect;
    Range moRange;
    bool mbAligned; // consists of whole blocks
    bool mbSharing; // shares blocks with the windows around it
    unsigned char* mpTarget;
    std::size_t mnPitch;
};

BlockImage::BlockImage(std::shared_ptr<IBlockSource> poSource, std::shared_ptr<BlockCache> poCache)
    : mpoSource(std::move(poSource)), moLayout(mpoSource->GetLayout()), mpoCache(std::move(poCache)),
      mbParts(mpoSource->ReadsParts())
{
    mbSmallBlocks =
        moLayout.GetPlaneCount() != 0 && std::uint64_t{moLayout.GetBlockWidth()} * moLayout.GetBlockHeight() <=
                                             LARGEST_KEPT_PART / moLayout.GetPixelBytes(0);
    if (mbParts)
    {
        mpoRowCache = std::make_unique<BlockCache>(ROW_CACHE_BYTES);
        mpoThinCache = std::make_unique<BlockCache>(ROW_CACHE_BYTES);
    }
}

BlockImage::~BlockImage()
{
    DropBlocks();
}

void BlockImage::DropBlocks()
{
    mpoCache->DropImage(this);
    if (mpoRowCache)
    {
        mpoRowCache->Clear();
        mpoThinCache->Clear();
    }
}

void BlockImage::NoteWindow(const Range& oRange, unsigned int nPlane)
{
    const bool bShared = nPlane == mnLastPlane && oRange.mnLeft <= maLastRange[2] && oRange.mnRight >= maLastRange[0] &&
                         oRange.mnTop <= maLastRange[3] && oRange.mnBottom >= maLastRange[1];
    mnSharing = std::clamp(mnSharing + (bShared ? 2 : -1), 0, SHARING_LIMIT);
    maLastRange[0] = oRange.mnLeft;
    maLastRange[1] = oRange.mnTop;
    maLastRange[2] = oRange.mnRight;
    maLastRange[3] = oRange.mnBottom;
    mnLastPlane = nPlane;
}

void BlockImage::Read(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget,
                      std::size_t nPitch)
{
    const Range oRange(moLayout, oRect);
    const PixelRect oFirst = moLayout.GetBlockRect(oRange.mnLeft, oRange.mnTop);
    const PixelRect oLast = moLayout.GetBlockRect(oRange.mnRight, oRange.mnBottom);
    const bool bAligned = Inside(oFirst, oRect) && Inside(oLast, oRect);
    NoteWindow(oRange, oChannels.GetPlaces().front().mnPlane);
    const Job oJob{oChannels, oRect, oRange, bAligned, mnSharing >= SHARING_THRESHOLD, pTarget, nPitch};
    if (mbParts && oJob.mbSharing)
        ReserveRowCache(oJob);
    for (unsigned int nRow = oRange.mnTop; nRow <= oRange.mnBottom; ++nRow)
        for (unsigned int nColumn = oRange.mnLeft; nColumn <= oRange.mnRight; ++nColumn)
            ReadPart(oJob, nColumn, nRow);
    moScratch.Shrink(KEPT_SCRATCH_BYTES);
}

// Room for just the blocks that ChooseKeep keeps of one window: the next one wants no others, and few blocks stay
// in the processor's own caches.
void BlockImage::ReserveRowCache(const Job& oJob)
{
    const Range& oRange = oJob.moRange;
    const std::uint64_t nBlocks = std::uint64_t{oRange.mnBottom - oRange.mnTop + 1 - CountThinRows(oJob)} *
                                  std::min(4u, oRange.mnRight - oRange.mnLeft + 1);
    const std::uint64_t nBlockBytes = std::uint64_t{moLayout.GetBlockWidth()} * moLayout.GetBlockHeight() *
                                      moLayout.GetPixelBytes(oJob.moChannels.GetPlaces().front().mnPlane);
    const std::uint64_t nPlanes = oJob.moChannels.IsOnePlane() ? 1 : oJob.moChannels.GetCount();
    if (nBlockBytes <= LARGEST_KEPT_PART && nBlocks * nPlanes <= BlockCache::MINIMUM_BOUND / nBlockBytes)
        mpoRowCache->Reserve(nBlocks * nPlanes * nBlockBytes);
}

// Of few rows of a block nothing is kept: they are read again at their own cost.
bool BlockImage::IsThin(unsigned int nRows) const
{
    return nRows <= moLayout.GetBlockHeight() / 4;
}

unsigned int BlockImage::CountThinRows(const Job& oJob) const
{
    const auto IsThinRow = [this, &oJob](unsigned int nRow)
    {
        const PixelRect oBlock = moLayout.GetBlockRect(oJob.moRange.mnLeft, nRow);
        return IsThin(Intersect({oJob.moRect.mnX, oBlock.mnY, 1, oBlock.mnHeight}, oJob.moRect).mnHeight);
    };
    const bool bOne = oJob.moRange.mnTop == oJob.moRange.mnBottom;
    return (IsThinRow(oJob.moRange.mnTop) ? 1u : 0u) + (!bOne && IsThinRow(oJob.moRange.mnBottom) ? 1u : 0u);
}

// Blocks near the window's edge are wanted again by its neighbours, the others are not.
BlockImage::Keep BlockImage::ChooseKeep(const Job& oJob, unsigned int nColumn, unsigned int nRow,
                                        const PixelRect& oPart) const
{
    const Range& oRange = oJob.moRange;
    const bool bNearSide = nColumn - oRange.mnLeft < 2 || oRange.mnRight - nColumn < 2;
    if (mbParts)
    {
        if (!oJob.mbSharing || oJob.mbAligned || !bNearSide || !mbSmallBlocks || moLayout.GetBlocksAcross() == 1)
            return Keep::eNothing;
        if (!IsThin(oPart.mnHeight))
            return Keep::eBlock;
        return oJob.moChannels.IsOnePlane() ? Keep::eRows : Keep::eNothing;
    }
    const bool bNearEdge = bNearSide || nRow - oRange.mnTop < 2 || oRange.mnBottom - nRow < 2;
    const PixelRect oBlock = moLayout.GetBlockRect(nColumn, nRow);
    const bool bWhole = oPart == PixelRect{0, 0, oBlock.mnWidth, oBlock.mnHeight};
    const bool bFurtherChannels = oJob.moChannels.IsOnePlane() && !oJob.moChannels.IsWholePlane();
    return !bWhole || (bNearEdge && !oJob.mbAligned) || bFurtherChannels ? Keep::eBlock : Keep::eNothing;
}

void BlockImage::ReadPart(const Job& oJob, unsigned int nColumn, unsigned int nRow)
{
    const PixelRect oBlock = moLayout.GetBlockRect(nColumn, nRow);
    PixelRect oPart = Intersect(oBlock, oJob.moRect);
    unsigned char* pTarget = oJob.mpTarget + static_cast<std::size_t>(oPart.mnY - oJob.moRect.mnY) * oJob.mnPitch +
                             static_cast<std::size_t>(oPart.mnX - oJob.moRect.mnX) * oJob.moChannels.GetPixelBytes();
    oPart.mnX -= oBlock.mnX;
    oPart.mnY -= oBlock.mnY;
    const Keep eKeep = ChooseKeep(oJob, nColumn, nRow, oPart);
    const BlockAddress oAddress{oJob.moChannels.GetPlaces().front().mnPlane, nColumn, nRow};
    if (oJob.moChannels.IsOnePlane())
        ReadOnePlane(oJob, oAddress, oPart, eKeep, pTarget);
    else
        ReadPlanes(oJob, oAddress, oPart, eKeep, pTarget);
}

BlockImage::Pixels BlockImage::FindBlock(const BlockAddress& oBlock, const PixelRect& oPart)
{
    BlockCache& oCache = GetCache();
    if (oCache.GetBytes() == 0)
        return {};
    const unsigned char* pBlock =
        oCache.Find({this, oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)});
    if (pBlock == nullptr)
        return {};
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    const std::size_t nPitch = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow).mnWidth * nPixelBytes;
    return {pBlock + oPart.mnY * nPitch + oPart.mnX * nPixelBytes, nPitch};
}

BlockImage::Pixels BlockImage::LoadBlock(const BlockAddress& oBlock, const PixelRect& oPart)
{
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nPitch = oRect.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    const BlockCache::Key oKey{this, oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)};
    unsigned char* pBlock = GetCache().Add(oKey, nPitch * oRect.mnHeight);
    FillEntry(GetCache(), oKey, oBlock, {0, 0, oRect.mnWidth, oRect.mnHeight}, pBlock);
    return FindBlock(oBlock, oPart);
}

// Nothing when the block is damaged and the part of it may be read for itself.
BlockImage::Pixels BlockImage::TryLoad(const BlockAddress& oBlock, const PixelRect& oPart)
{
    try
    {
        return LoadBlock(oBlock, oPart);
    }
    catch (const krv::FileException&)
    {
        if (!mpoSource->SparesParts())
            throw;
        return {};
    }
}

// The same rows of a block in all of its width: the windows beside this one want further columns of them.
BlockImage::Pixels BlockImage::GetRows(const BlockAddress& oBlock, const PixelRect& oPart)
{
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    const std::size_t nPitch = oRect.mnWidth * nPixelBytes;
    const BlockCache::Key oKey{this, oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow), oPart.mnY,
                               oPart.mnHeight};
    unsigned char* pRows = mpoThinCache->Find(oKey);
    if (pRows == nullptr)
    {
        mpoThinCache->Reserve(THIN_ENTRIES * nPitch * oPart.mnHeight);
        pRows = mpoThinCache->Add(oKey, nPitch * oPart.mnHeight);
        FillEntry(*mpoThinCache, oKey, oBlock, {0, oPart.mnY, oRect.mnWidth, oPart.mnHeight}, pRows);
    }
    return {pRows + oPart.mnX * nPixelBytes, nPitch};
}

void BlockImage::FillEntry(BlockCache& oCache, const BlockCache::Key& oKey, const BlockAddress& oBlock,
                           const PixelRect& oPart, unsigned char* pTarget)
{
    try
    {
        mpoSource->ReadBlock(oBlock, oPart, pTarget, oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane));
    }
    catch (...)
    {
        oCache.Drop(oKey);
        throw;
    }
}

BlockImage::Pixels BlockImage::ObtainPart(const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                                          Scratch& oScratch)
{
    const Pixels oCached = FindBlock(oBlock, oPart);
    if (oCached.mpFirst != nullptr)
        return oCached;
    if (eKeep == Keep::eRows)
        return GetRows(oBlock, oPart);
    if (const Pixels oLoaded = eKeep == Keep::eBlock ? TryLoad(oBlock, oPart) : Pixels(); oLoaded.mpFirst != nullptr)
        return oLoaded;
    const std::size_t nPitch = oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    unsigned char* pScratch = oScratch.Get(nPitch * oPart.mnHeight);
    mpoSource->ReadBlock(oBlock, oPart, pScratch, nPitch);
    return {pScratch, nPitch};
}

void BlockImage::ReadOnePlane(const Job& oJob, const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                              unsigned char* pTarget)
{
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    if (oJob.moChannels.IsWholePlane())
    {
        Pixels oPixels = FindBlock(oBlock, oPart);
        if (oPixels.mpFirst == nullptr && eKeep != Keep::eNothing)
            oPixels = eKeep == Keep::eBlock ? TryLoad(oBlock, oPart) : GetRows(oBlock, oPart);
        if (oPixels.mpFirst == nullptr)
            return mpoSource->ReadBlock(oBlock, oPart, pTarget, oJob.mnPitch);
        return raster::CopyRows(oPixels.mpFirst, oPixels.mnPitch, pTarget, oJob.mnPitch, oPart.mnWidth * nPixelBytes,
                                oPart.mnHeight);
    }
    const std::size_t nRowBytes = std::max<std::size_t>(1, oPart.mnWidth * nPixelBytes);
    const auto nSlice = mbParts && eKeep == Keep::eNothing
                            ? static_cast<unsigned int>(std::max<std::size_t>(1, SLICE_BYTES / nRowBytes))
                            : oPart.mnHeight;
    for (unsigned int nRow = 0; nRow < oPart.mnHeight; nRow += std::min(nSlice, oPart.mnHeight - nRow))
    {
        const PixelRect oSlice{oPart.mnX, oPart.mnY + nRow, oPart.mnWidth, std::min(nSlice, oPart.mnHeight - nRow)};
        const Pixels oPixels = ObtainPart(oBlock, oSlice, eKeep, moScratch);
        raster::GatherChannels(oPixels.mpFirst, oPixels.mnPitch, moLayout.GetPlane(oBlock.mnPlane).mnChannels,
                               pTarget + nRow * oJob.mnPitch, oJob.mnPitch, oJob.moChannels.GetPositions().data(),
                               oJob.moChannels.GetCount(),
                               {oSlice.mnWidth, oSlice.mnHeight, oJob.moChannels.GetValueBytes()});
    }
}

void BlockImage::ReadPlanes(const Job& oJob, const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                            unsigned char* pTarget)
{
    const ChannelSelection& oChannels = oJob.moChannels;
    const raster::PixelArea oArea{oPart.mnWidth, oPart.mnHeight, oChannels.GetValueBytes()};
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nBlockBytes = std::size_t{oRect.mnWidth} * oRect.mnHeight * oChannels.GetValueBytes();
    const std::size_t nLimit = eKeep != Keep::eNothing ? GetCache().GetBound() : PLANES_BYTES;
    const bool bTogether = oChannels.IsSinglePlanes() && nBlockBytes <= nLimit / oChannels.GetCount();
    if (bTogether && moPlaneScratch.size() < oChannels.GetCount())
        moPlaneScratch.resize(oChannels.GetCount());

    std::vector<Pixels> oPixels(bTogether ? oChannels.GetCount() : 0);
    for (std::size_t nAt = 0; nAt < oChannels.GetCount(); ++nAt)
    {
        const ChannelPlace& oPlace = oChannels.GetPlaces()[nAt];
        Scratch& oScratch = bTogether ? moPlaneScratch[nAt] : moScratch;
        const Pixels oPart1 = ObtainPart({oPlace.mnPlane, oBlock.mnColumn, oBlock.mnRow}, oPart, eKeep, oScratch);
        if (bTogether)
            oPixels[nAt] = oPart1;
        else
            CopyChannel(oPart1.mpFirst, oPart1.mnPitch, oPlace.mnPosition, moLayout.GetPlane(oPlace.mnPlane).mnChannels,
                        pTarget, oJob.mnPitch, nAt, oChannels.GetCount(), oArea);
    }
    if (bTogether)
        InterleaveParts(oPixels, pTarget, oJob.mnPitch, oArea);
}

void BlockImage::InterleaveParts(const std::vector<Pixels>& oParts, unsigned char* pTarget, std::size_t nPitch,
                                 const raster::PixelArea& oArea)
{
    const std::size_t nCommonPitch = oParts.front().mnPitch;
    std::vector<const unsigned char*> oFirst;
    for (const Pixels& oPart : oParts)
        if (oPart.mnPitch == nCommonPitch)
            oFirst.push_back(oPart.mpFirst);
    if (oFirst.size() == oParts.size())
        return raster::InterleavePlanes(oFirst.data(), nCommonPitch, pTarget, nPitch, oParts.size(), oArea);
    for (std::size_t nAt = 0; nAt < oParts.size(); ++nAt)
        raster::PlaceChannel(oParts[nAt].mpFirst, oParts[nAt].mnPitch, pTarget, nPitch, nAt, oParts.size(), oArea);
}

// One channel of pixels of several channels into one channel of other pixels.
void BlockImage::CopyChannel(const unsigned char* pSource, std::size_t nSourcePitch, std::size_t nSourceChannel,
                             std::size_t nSourceChannels, unsigned char* pTarget, std::size_t nTargetPitch,
                             std::size_t nTargetChannel, std::size_t nTargetChannels, const raster::PixelArea& oArea)
{
    if (nSourceChannels == 1)
        return raster::PlaceChannel(pSource, nSourcePitch, pTarget, nTargetPitch, nTargetChannel, nTargetChannels,
                                    oArea);
    const std::size_t nPitch = oArea.mnWidth * oArea.mnSampleBytes;
    unsigned char* pPlane = moChannelScratch.Get(nPitch * oArea.mnRows);
    raster::ExtractChannel(pSource, nSourcePitch, nSourceChannel, nSourceChannels, pPlane, nPitch, oArea);
    raster::PlaceChannel(pPlane, nPitch, pTarget, nTargetPitch, nTargetChannel, nTargetChannels, oArea);
}

void BlockImage::Write(const ChannelSelection& oChannels, const PixelRect& oRect, const unsigned char* pSource,
                       std::size_t nPitch)
{
    std::vector<unsigned int> oPlanes;
    for (const ChannelPlace& oPlace : oChannels.GetPlaces())
        oPlanes.push_back(oPlace.mnPlane);
    std::sort(oPlanes.begin(), oPlanes.end());
    oPlanes.erase(std::unique(oPlanes.begin(), oPlanes.end()), oPlanes.end());

    const Range oRange(moLayout, oRect);
    for (unsigned int nRow = oRange.mnTop; nRow <= oRange.mnBottom; ++nRow)
        for (unsigned int nColumn = oRange.mnLeft; nColumn <= oRange.mnRight; ++nColumn)
            for (unsigned int nPlane : oPlanes)
                WritePart(oChannels, oRect, {nPlane, nColumn, nRow}, pSource, nPitch);
}

// Channels of the plane that are not written keep their values: the part is read before.
void BlockImage::WritePart(const ChannelSelection& oChannels, const PixelRect& oRect, const BlockAddress& oBlock,
                           const unsigned char* pSource, std::size_t nPitch)
{
    const PixelRect oBlockRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    PixelRect oPart = Intersect(oBlockRect, oRect);
    pSource += (oPart.mnY - oRect.mnY) * nPitch + (oPart.mnX - oRect.mnX) * oChannels.GetPixelBytes();
    oPart.mnX -= oBlockRect.mnX;
    oPart.mnY -= oBlockRect.mnY;
    GetCache().Drop({this, oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)});
    if (mpoThinCache)
        mpoThinCache->Clear();
    if (oChannels.IsWholePlane())
        return mpoSource->WriteBlock(oBlock, oPart, pSource, nPitch);

    const unsigned int nPlaneChannels = moLayout.GetPlane(oBlock.mnPlane).mnChannels;
    const std::size_t nPlanePitch = oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    unsigned char* pPlane = moScratch.Get(nPlanePitch * oPart.mnHeight);
    if (!oChannels.CoversPlane(oBlock.mnPlane, nPlaneChannels))
    {
        const Pixels oOld = ObtainPart(oBlock, oPart, mbParts ? Keep::eNothing : Keep::eBlock, moScratch);
        if (oOld.mpFirst != pPlane)
            raster::CopyRows(oOld.mpFirst, oOld.mnPitch, pPlane, nPlanePitch, nPlanePitch, oPart.mnHeight);
        GetCache().Drop({this, oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)});
    }
    const raster::PixelArea oArea{oPart.mnWidth, oPart.mnHeight, oChannels.GetValueBytes()};
    for (std::size_t nAt = 0; nAt < oChannels.GetCount(); ++nAt)
    {
        const ChannelPlace& oPlace = oChannels.GetPlaces()[nAt];
        if (oPlace.mnPlane != oBlock.mnPlane)
            continue;
        if (nPlaneChannels == 1)
            raster::ExtractChannel(pSource, nPitch, nAt, oChannels.GetCount(), pPlane, nPlanePitch, oArea);
        else
            CopyChannel(pSource, nPitch, nAt, oChannels.GetCount(), pPlane, nPlanePitch, oPlace.mnPosition,
                        nPlaneChannels, oArea);
    }
    mpoSource->WriteBlock(oBlock, oPart, pPlane, nPlanePitch);
}

} // namespace krv::plugins::support
