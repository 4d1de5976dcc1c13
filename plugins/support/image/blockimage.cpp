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
// The same of planes that lie in the store.
constexpr std::size_t MOST_PLANES_BYTES = std::size_t{256} << 20;
// Memory that stays with an image between windows.
constexpr std::size_t KEPT_SCRATCH_BYTES = std::size_t{4} << 20;
constexpr std::uint64_t LARGEST_KEPT_PART = std::uint64_t{16} << 20;
// Three blocks above a window and three below, and the two that are about to go.
constexpr std::uint64_t THIN_ENTRIES = 8;
constexpr int SHARING_LIMIT = 6;
constexpr int SHARING_THRESHOLD = 2;
// So many blocks are foreseen together.
constexpr unsigned int FORESEEN_BLOCKS = 8;

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

// Decoded pixels of one plane: pointer to the first one of a part, and the bytes from row to row; where they lie in the
// store, with the hold on them. A block that another thread is decoding has none.
struct BlockImage::Pixels
{
    const unsigned char* mpFirst = nullptr;
    std::size_t mnPitch = 0;
    bool mbComing = false;
    krv::cache::TileHold moHold;

    Pixels() = default;
    Pixels(const unsigned char* pFirst, std::size_t nPitch) : mpFirst(pFirst), mnPitch(nPitch) {}
    explicit Pixels(krv::cache::TileHold oHold)
        : mpFirst(oHold.GetFirst()), mnPitch(oHold.GetPitch()), moHold(std::move(oHold))
    {
    }
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

BlockImage::BlockImage(std::shared_ptr<IBlockSource> poSource, const std::shared_ptr<BlockCache>& poCache)
    : mpoSource(std::move(poSource)), moLayout(mpoSource->GetLayout()), moTiles(*mpoSource, *poCache), moPass(moLayout),
      mbParts(mpoSource->ReadsParts())
{
    mbSmallBlocks =
        moLayout.GetPlaneCount() != 0 && std::uint64_t{moLayout.GetBlockWidth()} * moLayout.GetBlockHeight() <=
                                             LARGEST_KEPT_PART / moLayout.GetPixelBytes(0);
    if (mbParts)
    {
        mpoRowCache = std::make_unique<RowCache>();
        mpoThinCache = std::make_unique<RowCache>();
    }
}

BlockImage::~BlockImage() = default;

void BlockImage::DropBlocks()
{
    moTiles.DropAll();
    if (mbParts)
    {
        mpoRowCache->Clear();
        mpoThinCache->Clear();
    }
}

void BlockImage::NoteWindow(const Range& oRange, unsigned int nPlane)
{
    const bool bShared = nPlane == mnLastPlane && oRange.mnLeft <= moLastRange[2] && oRange.mnRight >= moLastRange[0] &&
                         oRange.mnTop <= moLastRange[3] && oRange.mnBottom >= moLastRange[1];
    mnSharing = std::clamp(mnSharing + (bShared ? 2 : -1), 0, SHARING_LIMIT);
    moLastRange[0] = oRange.mnLeft;
    moLastRange[1] = oRange.mnTop;
    moLastRange[2] = oRange.mnRight;
    moLastRange[3] = oRange.mnBottom;
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
    if (!mbParts && !bAligned)
        NotePass(oJob);
    moLater.clear();
    for (unsigned int nRow = oRange.mnTop; nRow <= oRange.mnBottom; ++nRow)
        for (unsigned int nColumn = oRange.mnLeft; nColumn <= oRange.mnRight; ++nColumn)
            if (!ReadPart(oJob, nColumn, nRow, Wait::eNo))
                moLater.emplace_back(nColumn, nRow);
    for (const auto& [nColumn, nRow] : moLater)
        static_cast<void>(ReadPart(oJob, nColumn, nRow, Wait::eYes));
    moScratch.Shrink(KEPT_SCRATCH_BYTES);
}

void BlockImage::NotePass(const Job& oJob)
{
    const std::vector<ChannelPlace>& oPlaces = oJob.moChannels.GetPlaces();
    const auto Done = [this, &oPlaces](unsigned int nColumn, unsigned int nRow, unsigned int nRows)
    {
        for (std::size_t nAt = 0; nAt < oPlaces.size(); ++nAt)
            if (nAt == 0 || oPlaces[nAt].mnPlane != oPlaces[nAt - 1].mnPlane)
                moTiles.Retire({oPlaces[nAt].mnPlane, nColumn, nRow}, nRows);
    };
    moPass.Note(oJob.moRect, Done);
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
    if (nBlockBytes <= LARGEST_KEPT_PART && nBlocks * nPlanes <= RowCache::MOST_BOUND / nBlockBytes)
        mpoRowCache->Reserve(nBlocks * nPlanes * nBlockBytes);
}

// Few rows of a block are not kept: they are read again at their own cost.
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

bool BlockImage::ReadPart(const Job& oJob, unsigned int nColumn, unsigned int nRow, Wait eWait)
{
    const PixelRect oBlock = moLayout.GetBlockRect(nColumn, nRow);
    PixelRect oPart = Intersect(oBlock, oJob.moRect);
    unsigned char* pTarget = oJob.mpTarget + static_cast<std::size_t>(oPart.mnY - oJob.moRect.mnY) * oJob.mnPitch +
                             static_cast<std::size_t>(oPart.mnX - oJob.moRect.mnX) * oJob.moChannels.GetPixelBytes();
    oPart.mnX -= oBlock.mnX;
    oPart.mnY -= oBlock.mnY;
    const Keep eKeep = ChooseKeep(oJob, nColumn, nRow, oPart);
    const BlockAddress oAddress{oJob.moChannels.GetPlaces().front().mnPlane, nColumn, nRow};
    return oJob.moChannels.IsOnePlane() ? ReadOnePlane(oJob, oAddress, oPart, eKeep, pTarget, eWait)
                                        : ReadPlanes(oJob, oAddress, oPart, eKeep, pTarget, eWait);
}

BlockImage::Pixels BlockImage::FindBlock(const BlockAddress& oBlock, const PixelRect& oPart)
{
    if (!mbParts)
        return Pixels(moTiles.Find(oBlock, oPart));
    const unsigned char* pBlock =
        mpoRowCache->Find({oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)});
    if (pBlock == nullptr)
        return {};
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    const std::size_t nPitch = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow).mnWidth * nPixelBytes;
    return {pBlock + oPart.mnY * nPitch + oPart.mnX * nPixelBytes, nPitch};
}

BlockImage::Pixels BlockImage::LoadPlainBlock(const BlockAddress& oBlock, const PixelRect& oPart)
{
    if (Pixels oFound = FindBlock(oBlock, oPart); oFound.mpFirst != nullptr)
        return oFound;
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nPitch = oRect.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    const RowCache::Key oKey{oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)};
    FillEntry(*mpoRowCache, oKey, oBlock, {0, 0, oRect.mnWidth, oRect.mnHeight},
              mpoRowCache->Add(oKey, nPitch * oRect.mnHeight));
    return FindBlock(oBlock, oPart);
}

BlockImage::Pixels BlockImage::LoadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned int nFollowing,
                                         Wait eWait)
{
    if (mbParts)
        return LoadPlainBlock(oBlock, oPart);
    Pixels oPixels(moTiles.Load(oBlock, oPart, moPass.GetBorder(), eWait, [&] { Announce(oBlock, nFollowing); }));
    oPixels.mbComing = oPixels.mpFirst == nullptr;
    return oPixels;
}

// What lies beside a block that is about to be read, as far as the window has it, and what the next windows want.
void BlockImage::Announce(const BlockAddress& oBlock, unsigned int nFollowing)
{
    if (nFollowing != 0)
        mpoSource->Expect(oBlock, nFollowing + 1);
    if (!moPass.IsPassing())
        return;
    BlockAddress oNext{oBlock.mnPlane, oBlock.mnColumn + nFollowing + 1, oBlock.mnRow};
    const unsigned int nAcross = moLayout.GetBlocksAcross();
    const bool bNextRow = oNext.mnColumn >= nAcross;
    if (bNextRow && (nAcross > 1 || oNext.mnRow + 1 >= moLayout.GetBlocksDown()))
        return;
    if (bNextRow)
        oNext = {oNext.mnPlane, 0, oNext.mnRow + 1};
    if (oNext.mnPlane == moForeseen.mnPlane && oNext.mnRow == moForeseen.mnRow && oNext.mnColumn < moForeseen.mnColumn)
        return;
    const unsigned int nBlocks = std::min(FORESEEN_BLOCKS, nAcross - oNext.mnColumn);
    moForeseen = {oNext.mnPlane, oNext.mnColumn + nBlocks, oNext.mnRow};
    mpoSource->Foresee(oNext, nBlocks);
}

// Nothing when the block is damaged and the part of it may be read for itself.
BlockImage::Pixels BlockImage::TryLoad(const BlockAddress& oBlock, const PixelRect& oPart, unsigned int nFollowing,
                                       Wait eWait)
{
    try
    {
        return LoadBlock(oBlock, oPart, nFollowing, eWait);
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
    const RowCache::Key oKey{oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow), oPart.mnY,
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

void BlockImage::FillEntry(RowCache& oCache, const RowCache::Key& oKey, const BlockAddress& oBlock,
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

// What is there already, or is to be kept from now on.
BlockImage::Pixels BlockImage::ObtainKept(const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                                          unsigned int nFollowing, Wait eWait)
{
    if (eKeep == Keep::eBlock)
        return TryLoad(oBlock, oPart, nFollowing, eWait);
    Pixels oFound = FindBlock(oBlock, oPart);
    return oFound.mpFirst == nullptr && eKeep == Keep::eRows ? GetRows(oBlock, oPart) : std::move(oFound);
}

BlockImage::Pixels BlockImage::ObtainPart(const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                                          Scratch& oScratch, unsigned int nFollowing, Wait eWait)
{
    Pixels oKept = ObtainKept(oBlock, oPart, eKeep, nFollowing, eWait);
    if (oKept.mpFirst != nullptr || oKept.mbComing)
        return oKept;
    const std::size_t nPitch = oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    unsigned char* pScratch = oScratch.Get(nPitch * oPart.mnHeight);
    mpoSource->ReadBlock(oBlock, oPart, pScratch, nPitch);
    return {pScratch, nPitch};
}

bool BlockImage::ReadOnePlane(const Job& oJob, const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                              unsigned char* pTarget, Wait eWait)
{
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(oBlock.mnPlane);
    const unsigned int nFollowing = oJob.moRange.mnRight - oBlock.mnColumn;
    if (oJob.moChannels.IsWholePlane())
    {
        const Pixels oPixels = ObtainKept(oBlock, oPart, eKeep, nFollowing, eWait);
        if (oPixels.mbComing)
            return false;
        if (oPixels.mpFirst == nullptr)
        {
            if (!mbParts && nFollowing != 0)
                mpoSource->Expect(oBlock, nFollowing + 1);
            mpoSource->ReadBlock(oBlock, oPart, pTarget, oJob.mnPitch);
            return true;
        }
        raster::CopyRows(oPixels.mpFirst, oPixels.mnPitch, pTarget, oJob.mnPitch, oPart.mnWidth * nPixelBytes,
                         oPart.mnHeight);
        return true;
    }
    const std::size_t nRowBytes = std::max<std::size_t>(1, oPart.mnWidth * nPixelBytes);
    const auto nSlice = mbParts && eKeep == Keep::eNothing
                            ? static_cast<unsigned int>(std::max<std::size_t>(1, SLICE_BYTES / nRowBytes))
                            : oPart.mnHeight;
    for (unsigned int nRow = 0; nRow < oPart.mnHeight; nRow += std::min(nSlice, oPart.mnHeight - nRow))
    {
        const PixelRect oSlice{oPart.mnX, oPart.mnY + nRow, oPart.mnWidth, std::min(nSlice, oPart.mnHeight - nRow)};
        const Pixels oPixels = ObtainPart(oBlock, oSlice, eKeep, moScratch, nFollowing, eWait);
        if (oPixels.mbComing)
            return false;
        raster::GatherChannels(oPixels.mpFirst, oPixels.mnPitch, moLayout.GetPlane(oBlock.mnPlane).mnChannels,
                               pTarget + nRow * oJob.mnPitch, oJob.mnPitch, oJob.moChannels.GetPositions().data(),
                               oJob.moChannels.GetCount(),
                               {oSlice.mnWidth, oSlice.mnHeight, oJob.moChannels.GetValueBytes()});
    }
    return true;
}

// Planes whose blocks another thread decodes come last. Nothing is given back half done: without waiting, the planes
// that are there are taken when all of them are.
bool BlockImage::ReadPlanes(const Job& oJob, const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                            unsigned char* pTarget, Wait eWait)
{
    const ChannelSelection& oChannels = oJob.moChannels;
    const raster::PixelArea oArea{oPart.mnWidth, oPart.mnHeight, oChannels.GetValueBytes()};
    const PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nBlockBytes = std::size_t{oRect.mnWidth} * oRect.mnHeight * oChannels.GetValueBytes();
    const std::size_t nLimit = eKeep == Keep::eNothing ? PLANES_BYTES
                               : mbParts               ? mpoRowCache->GetBound()
                                                       : MOST_PLANES_BYTES;
    const bool bTogether = oChannels.IsSinglePlanes() && nBlockBytes <= nLimit / oChannels.GetCount();
    if (bTogether && moPlaneScratch.size() < oChannels.GetCount())
        moPlaneScratch.resize(oChannels.GetCount());

    std::vector<Pixels> oPixels(bTogether ? oChannels.GetCount() : 0);
    bool bAll = true;
    for (std::size_t nAt = 0; nAt < oChannels.GetCount(); ++nAt)
    {
        const ChannelPlace& oPlace = oChannels.GetPlaces()[nAt];
        Scratch& oScratch = bTogether ? moPlaneScratch[nAt] : moScratch;
        Pixels oPart1 = ObtainPart({oPlace.mnPlane, oBlock.mnColumn, oBlock.mnRow}, oPart, eKeep, oScratch,
                                   oJob.moRange.mnRight - oBlock.mnColumn, eWait);
        if (oPart1.mbComing)
            bAll = false;
        else if (bTogether)
            oPixels[nAt] = std::move(oPart1);
        else
            CopyChannel(oPart1.mpFirst, oPart1.mnPitch, oPlace.mnPosition, moLayout.GetPlane(oPlace.mnPlane).mnChannels,
                        pTarget, oJob.mnPitch, nAt, oChannels.GetCount(), oArea);
    }
    if (bAll && bTogether)
        InterleaveParts(oPixels, pTarget, oJob.mnPitch, oArea);
    return bAll;
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

void BlockImage::ForgetBlock(const BlockAddress& oBlock)
{
    if (!mbParts)
        return moTiles.Drop(oBlock);
    mpoRowCache->Drop({oBlock.mnPlane, moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)});
    mpoThinCache->Clear();
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
    ForgetBlock(oBlock);
    if (oChannels.IsWholePlane())
        return mpoSource->WriteBlock(oBlock, oPart, pSource, nPitch);

    const unsigned int nPlaneChannels = moLayout.GetPlane(oBlock.mnPlane).mnChannels;
    const std::size_t nPlanePitch = oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    unsigned char* pPlane = moScratch.Get(nPlanePitch * oPart.mnHeight);
    if (!oChannels.CoversPlane(oBlock.mnPlane, nPlaneChannels))
    {
        const Pixels oOld =
            ObtainPart(oBlock, oPart, mbParts ? Keep::eNothing : Keep::eBlock, moScratch, 0, Wait::eYes);
        if (oOld.mpFirst != pPlane)
            raster::CopyRows(oOld.mpFirst, oOld.mnPitch, pPlane, nPlanePitch, nPlanePitch, oPart.mnHeight);
        ForgetBlock(oBlock);
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
