#include "plugins/krvdsk/pixels/tilesource.h"

#include "plugins/support/codec/checksum.h"
#include "plugins/support/writing/narrowsamples.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace krv::plugins::krvdsk
{

namespace
{

constexpr std::uint64_t LEAST_HELD_BYTES = std::uint64_t{16} << 20;
constexpr std::uint64_t MOST_HELD_BYTES = std::uint64_t{256} << 20;
constexpr std::size_t KEPT_SCRATCH_BYTES = std::size_t{4} << 20;

// Two rows of tiles, so that an image that comes row by row stores every tile once.
std::size_t ChooseBound(const support::ImageLayout& oLayout, std::size_t nPixelBytes)
{
    const std::uint64_t nRow = std::uint64_t{oLayout.GetWidth()} * nPixelBytes;
    const std::uint64_t nRows = std::uint64_t{2} * oLayout.GetBlockHeight();
    const std::uint64_t nMost = MOST_HELD_BYTES / oLayout.GetPlaneCount();
    const std::uint64_t nLeast = std::min(LEAST_HELD_BYTES, nMost);
    return static_cast<std::size_t>(std::clamp(nRow > nMost ? nMost : nRow * std::min(nRows, nMost), nLeast, nMost));
}

support::HeldBlocks::SettlePixels MakeSettling(const Plane& oPlane)
{
    if (oPlane.moType.GetBits() < 8)
        return &support::HeldBlocks::SettleBits;
    return oPlane.mnKeptBits == 0 ? nullptr : support::MakeNarrowing(oPlane.moType, oPlane.mnKeptBits);
}

} // namespace

support::ImageLayout TileSource::MakeLayout(const Catalogue& oCatalogue, const Origin& oOrigin)
{
    std::vector<support::Plane> oPlanes;
    for (const std::shared_ptr<Plane>& poPlane : oOrigin.moPlanes)
    {
        const bool bBits = poPlane->moType.GetBits() < 8;
        oPlanes.push_back({bBits ? krv::gobs::DataType(krv::gobs::eDT_8U) : poPlane->moType, poPlane->GetChannels(),
                           poPlane->GetNativeType()});
    }
    return {oOrigin.moSize.mnWidth, oOrigin.moSize.mnHeight, oCatalogue.mnBlockWidth, oCatalogue.mnBlockHeight,
            std::move(oPlanes)};
}

TileSource::TileSource(const Catalogue& oCatalogue, Origin oOrigin)
    : moOrigin(std::move(oOrigin)), moLayout(MakeLayout(oCatalogue, moOrigin))
{
    for (std::size_t nPlane = 0; nPlane < moOrigin.moPlanes.size(); ++nPlane)
    {
        moWorks.push_back(MakeWork(nPlane));
        mbPlain = mbPlain && moWorks.back()->moCodec.IsPlain();
    }
}

TileSource::~TileSource() = default;

std::unique_ptr<TileSource::Work> TileSource::MakeWork(std::size_t nPlane)
{
    const std::shared_ptr<Plane>& poPlane = moOrigin.moPlanes[nPlane];
    const std::size_t nPixelBytes = moLayout.GetPixelBytes(static_cast<unsigned int>(nPlane));
    const auto StoreBlock =
        [this, nPlane, nPixelBytes](const support::HeldBlocks::Block& oBlock, const unsigned char* pPixels)
    {
        StoreTile(*moWorks[nPlane], {oBlock.mnNumber, oBlock.moRect}, pPixels, oBlock.moRect.mnWidth * nPixelBytes);
    };
    return std::unique_ptr<Work>(new Work{
        poPlane, poPlane->moTables.at(moOrigin.mnLevel),
        TileCodec(*poPlane, {moLayout.GetBlockWidth(), moLayout.GetBlockHeight()}),
        support::HeldBlocks(ChooseBound(moLayout, nPixelBytes), nPixelBytes, StoreBlock, MakeSettling(*poPlane))});
}

TileSource::Spot TileSource::GetSpot(const support::BlockAddress& oBlock) const
{
    return {moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow),
            moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow)};
}

void TileSource::Fail(const Work& oWork, const Spot& oSpot, const std::string& cause) const
{
    moOrigin.mpoStore->Fail(oWork.mpoTable->Describe() + ", tile " +
                            std::to_string(oSpot.moRect.mnX / moLayout.GetBlockWidth()) + ", " +
                            std::to_string(oSpot.moRect.mnY / moLayout.GetBlockHeight()) + ": " + cause);
}

// The room of a plane that was deleted may hold something else by now.
void TileSource::CheckPlane(const Work& oWork) const
{
    if (oWork.mpoPlane->mbGone)
        throw DataException(GetName() + ": the channels of these pixels are no longer there");
}

void TileSource::Verify(Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile, std::uint32_t nChecksum) const
{
    if (nChecksum != oTile.moEntry.mnChecksum)
        Fail(oWork, oSpot, "is damaged: its checksum is wrong");
    oWork.mpoTable->SetVerified(oTile);
}

// In one state of a file the place of a table tells its tiles from all others; those of empty tables are all alike.
support::BlockOrigin TileSource::GetOrigin() const
{
    std::string image = "KRVDSK";
    for (const std::unique_ptr<Work>& poWork : moWorks)
        image += " " + std::to_string(poWork->mpoTable->GetTop().mnOffset);
    return {moOrigin.mpoStore->ShareFile(), std::move(image)};
}

void TileSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                           std::size_t nPitch)
{
    Work& oWork = *moWorks[oBlock.mnPlane];
    CheckPlane(oWork);
    const Spot oSpot = GetSpot(oBlock);
    ReadStored(oWork, oSpot, oPart, pTarget, nPitch);
    if (!oWork.moHeld.IsEmpty())
        oWork.moHeld.Overlay(
            oSpot.mnTile, {oSpot.moRect.mnX + oPart.mnX, oSpot.moRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight},
            pTarget, nPitch);
}

// oPart counts from the tile's corner; it is all of the tile unless tiles lie plain.
void TileSource::ReadStored(Work& oWork, const Spot& oSpot, const support::PixelRect& oPart, unsigned char* pTarget,
                            std::size_t nPitch)
{
    const TileTable::Tile* const pTile = oWork.mpoTable->Find(*moOrigin.mpoStore, oSpot.mnTile);
    if (pTile == nullptr)
    {
        const std::size_t nValue = oWork.mpoPlane->moType.GetBits() < 8 ? 1 : oWork.mpoPlane->moType.GetValueBits() / 8;
        for (unsigned int nRow = 0; nRow < oPart.mnHeight; ++nRow)
            std::memset(pTarget + nRow * nPitch, 0, oPart.mnWidth * nValue * oWork.mpoPlane->GetChannels());
        return;
    }
    const std::size_t nMost = oWork.moCodec.GetLargest(oSpot.moRect.mnWidth, oSpot.moRect.mnHeight);
    const bool bPlain = oWork.moCodec.IsPlain();
    if (pTile->moEntry.mnBytes > nMost || (bPlain && pTile->moEntry.mnBytes != nMost))
        Fail(oWork, oSpot, "is damaged: it has " + std::to_string(pTile->moEntry.mnBytes) + " bytes");
    if (!pTile->mbVerified)
        moOrigin.mpoStore->CheckPlace(pTile->moEntry, oWork.mpoTable->Describe());
    if (bPlain)
        ReadPlain(oWork, oSpot, *pTile, oPart, pTarget, nPitch);
    else
        ReadCoded(oWork, oSpot, *pTile, pTarget, nPitch);
}

void TileSource::ReadPlainRows(const Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile,
                               const support::PixelRect& oPart, unsigned char* pTarget, std::size_t nPitch)
{
    const ImageSize oStored = oWork.moCodec.GetStoredSize(oSpot.moRect.mnWidth, oSpot.moRect.mnHeight);
    const std::size_t nStoredPitch = oWork.moCodec.GetStoredRowBytes(oStored.mnWidth);
    moOrigin.mpoStore->GetFile().ReadRows(
        oTile.moEntry.mnOffset + oPart.mnY * nStoredPitch + oWork.moCodec.GetStoredRowBytes(oPart.mnX), nStoredPitch,
        oWork.moCodec.GetStoredRowBytes(oPart.mnWidth), oPart.mnHeight, pTarget, nPitch, moRows);
}

void TileSource::ReadPlain(Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile,
                           const support::PixelRect& oPart, unsigned char* pTarget, std::size_t nPitch)
{
    const TileCodec& oCodec = oWork.moCodec;
    const ImageSize oStored = oCodec.GetStoredSize(oSpot.moRect.mnWidth, oSpot.moRect.mnHeight);
    const support::PixelRect oWhole{0, 0, oStored.mnWidth, oStored.mnHeight};
    const std::size_t nWholePitch = oCodec.GetStoredRowBytes(oWhole.mnWidth);
    if (oCodec.IsWhole() && !oTile.mbVerified && oPart == oWhole && nPitch == nWholePitch)
        return Verify(oWork, oSpot, oTile,
                      moOrigin.mpoStore->ReadSummed(oTile.moEntry.mnOffset, pTarget, nPitch * oWhole.mnHeight));
    if (oCodec.IsWhole() && (oTile.mbVerified || oPart == oWhole))
    {
        ReadPlainRows(oWork, oSpot, oTile, oPart, pTarget, nPitch);
        if (!oTile.mbVerified)
            Verify(oWork, oSpot, oTile, codec::Checksum(pTarget, nPitch, nWholePitch, oWhole.mnHeight));
        return;
    }
    // A part of what nobody looked at yet: all of it is read for its checksum.
    const support::PixelRect& oRead = oTile.mbVerified ? oPart : oWhole;
    const std::size_t nReadPitch = oCodec.GetStoredRowBytes(oRead.mnWidth);
    unsigned char* pRead = moStored.Get(nReadPitch * oRead.mnHeight);
    if (oTile.mbVerified)
        ReadPlainRows(oWork, oSpot, oTile, oRead, pRead, nReadPitch);
    else
    {
        Verify(oWork, oSpot, oTile,
               moOrigin.mpoStore->ReadSummed(oTile.moEntry.mnOffset, pRead, nReadPitch * oRead.mnHeight));
        pRead += oPart.mnY * nReadPitch + oCodec.GetStoredRowBytes(oPart.mnX);
    }
    if (oCodec.IsWhole())
        raster::CopyRows(pRead, nReadPitch, pTarget, nPitch, oCodec.GetStoredRowBytes(oPart.mnWidth), oPart.mnHeight);
    else
        oCodec.Pick(pRead, nReadPitch, oPart.mnWidth, oPart.mnHeight, pTarget, nPitch);
    moStored.Shrink(KEPT_SCRATCH_BYTES);
}

void TileSource::ReadCoded(Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile, unsigned char* pTarget,
                           std::size_t nPitch)
{
    const Entry& oEntry = oTile.moEntry;
    unsigned char* pStored = moStored.Get(oEntry.mnBytes);
    if (oTile.mbVerified)
        moOrigin.mpoStore->GetFile().Read(oEntry.mnOffset, pStored, oEntry.mnBytes);
    else
        Verify(oWork, oSpot, oTile, moOrigin.mpoStore->ReadSummed(oEntry.mnOffset, pStored, oEntry.mnBytes));
    const char* const pCause =
        oWork.moCodec.Decode(pStored, oEntry.mnBytes, oSpot.moRect.mnWidth, oSpot.moRect.mnHeight, pTarget, nPitch);
    if (pCause != nullptr)
        Fail(oWork, oSpot, pCause);
    moStored.Shrink(KEPT_SCRATCH_BYTES);
}

void TileSource::WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                            const unsigned char* pSource, std::size_t nPitch)
{
    if (!moOrigin.mpoWriter)
        return IBlockSource::WriteBlock(oBlock, oPart, pSource, nPitch);
    moOrigin.mpoWriter->CheckWritable();
    Work& oWork = *moWorks[oBlock.mnPlane];
    CheckPlane(oWork);
    if (moOrigin.moBeforeWrite)
        moOrigin.moBeforeWrite();
    const Spot oSpot = GetSpot(oBlock);
    if (oPart == support::PixelRect{0, 0, oSpot.moRect.mnWidth, oSpot.moRect.mnHeight})
    {
        StoreTile(oWork, oSpot, pSource, nPitch);
        return oWork.moHeld.Forget(oSpot.mnTile);
    }
    const auto Read = [&](unsigned char* pPixels, std::size_t nHeldPitch)
    {
        ReadStored(oWork, oSpot, {0, 0, oSpot.moRect.mnWidth, oSpot.moRect.mnHeight}, pPixels, nHeldPitch);
    };
    oWork.moHeld.Write({oSpot.mnTile, oSpot.moRect},
                       {oSpot.moRect.mnX + oPart.mnX, oSpot.moRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight},
                       pSource, nPitch, Read);
}

void TileSource::StoreTile(Work& oWork, const Spot& oSpot, const unsigned char* pPixels, std::size_t nPitch)
{
    const std::span<const unsigned char> oBytes =
        oWork.moCodec.Encode(pPixels, nPitch, oSpot.moRect.mnWidth, oSpot.moRect.mnHeight);
    if (oBytes.empty())
        moOrigin.mpoWriter->DropTile(*oWork.mpoTable, oSpot.mnTile);
    else
        moOrigin.mpoWriter->WriteTile(*oWork.mpoTable, oSpot.mnTile, oBytes.data(), oBytes.size());
}

bool TileSource::Holds() const
{
    return std::any_of(moWorks.begin(), moWorks.end(),
                       [](const std::unique_ptr<Work>& poWork) { return !poWork->moHeld.IsEmpty(); });
}

void TileSource::StoreHeld()
{
    for (const std::unique_ptr<Work>& poWork : moWorks)
    {
        if (poWork->mpoPlane->mbGone)
            poWork->moHeld.Clear();
        poWork->moHeld.StoreAll();
    }
}

} // namespace krv::plugins::krvdsk
