#include "datasources/writer/detail/multitypeio.h"

#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hblock.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <string>
#include <utility>

namespace krv::datasources::detail
{

// The rasters of all groups over one rectangle, in one block of memory.
class MultiTypeIO::Parts
{
public:
    Parts(const std::vector<WriterGroup>& oGroups, const PixelRect& oRect)
    {
        std::vector<std::uint64_t> oOffsets;
        std::uint64_t nBytes = 0;
        for (const WriterGroup& oGroup : oGroups)
        {
            const krv::gobs::DataType& oType = oGroup.mpoWriter->GetDataType();
            oOffsets.push_back(nBytes);
            nBytes += krv::gobs::BufferBytes(oRect.mnWidth, oRect.mnHeight, oGroup.moPositions.size(), oType);
            nBytes = (nBytes + 63) / 64 * 64;
            moRowBytes.push_back(oGroup.moPositions.size() * (oType.GetValueBits() / 8) * oRect.mnWidth);
        }
        mpoBlock.reset(static_cast<unsigned char*>(HMalloc(nBytes)));
        for (std::size_t nGroup = 0; nGroup < oGroups.size(); ++nGroup)
        {
            const krv::gobs::RasterInfo oInfo(oRect.mnWidth, oRect.mnHeight,
                                              static_cast<unsigned int>(oGroups[nGroup].moPositions.size()),
                                              oGroups[nGroup].mpoWriter->GetDataType());
            const krv::gobs::RasterContext oContext(static_cast<int>(oRect.mnX), static_cast<int>(oRect.mnY));
            moRasters.push_back(
                std::make_unique<krv::gobs::Raster>(oInfo, oContext, mpoBlock.get() + oOffsets[nGroup], false));
        }
    }

    krv::gobs::Raster& Get(std::size_t nGroup) { return *moRasters[nGroup]; }
    // The first pixels of a row in the buffers of all groups.
    template <typename Byte>
    std::vector<Byte*> GetRow(std::size_t nRow)
    {
        std::vector<Byte*> oRow;
        for (std::size_t nGroup = 0; nGroup < moRasters.size(); ++nGroup)
            oRow.push_back(moRasters[nGroup]->GetBuffer() + nRow * moRowBytes[nGroup]);
        return oRow;
    }

private:
    HBlock mpoBlock;
    std::vector<std::size_t> moRowBytes;
    std::vector<std::unique_ptr<krv::gobs::Raster>> moRasters;
};

namespace
{

// Rows without gaps between them are one.
template <typename Work>
void ForEachRun(const PixelRect& oRect, std::size_t nPixelBytes, std::size_t nPitch, const Work& oWork)
{
    if (nPitch == nPixelBytes * oRect.mnWidth)
        return oWork(0, std::uint64_t{oRect.mnWidth} * oRect.mnHeight);
    for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
        oWork(nRow, oRect.mnWidth);
}

// Cuts a rectangle after rows of blocks, so that what lies between a raster and its groups stays small.
template <typename Work>
void ForEachBand(const PixelRect& oRect, unsigned int nBlockHeight, const Work& oWork)
{
    const std::uint64_t nBottom = std::uint64_t{oRect.mnY} + oRect.mnHeight;
    for (std::uint64_t nY = oRect.mnY; nY < nBottom;)
    {
        const std::uint64_t nEnd = std::min((nY / nBlockHeight + 1) * nBlockHeight, nBottom);
        oWork(PixelRect{oRect.mnX, static_cast<unsigned int>(nY), oRect.mnWidth, static_cast<unsigned int>(nEnd - nY)});
        nY = nEnd;
    }
}

} // namespace

MultiTypeIO::MultiTypeIO(std::vector<WriterGroup> oGroups, const krv::gobs::DataType& oType,
                         std::shared_ptr<SampleChanges> poChanges)
    : moGroups(std::move(oGroups)), moType(oType), mpoChanges(std::move(poChanges))
{
    std::vector<krv::raster::SplitTarget> oTargets;
    for (const WriterGroup& oGroup : moGroups)
    {
        oTargets.push_back(
            {krv::gobs::QRFDataType2RasterBufferType(oGroup.mpoWriter->GetDataType()), oGroup.moPositions});
        mnBlockHeight = std::max(mnBlockHeight, oGroup.mpoWriter->GetTileHeight());
        mbMemory = mbMemory && oGroup.mpoMemory != nullptr;
        moSplitPositions.insert(moSplitPositions.end(), oGroup.moPositions.begin(), oGroup.moPositions.end());
    }
    mnPixelBytes = moSplitPositions.size() * (oType.GetValueBits() / 8);
    moSplitter.emplace(krv::gobs::QRFDataType2RasterBufferType(oType),
                       static_cast<unsigned int>(moSplitPositions.size()), oTargets);
}

MultiTypeIO::~MultiTypeIO() = default;

void MultiTypeIO::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    if (!moMerger)
    {
        std::vector<krv::raster::MergeSource> oSources;
        std::vector<krv::raster::MergeChannel> oPlaces(moSplitPositions.size());
        for (const WriterGroup& oGroup : moGroups)
        {
            const auto nSource = static_cast<unsigned int>(oSources.size());
            for (unsigned int nChannel = 0; nChannel < oGroup.moPositions.size(); ++nChannel)
                oPlaces[oGroup.moPositions[nChannel]] = {nSource, nChannel};
            oSources.push_back({krv::gobs::QRFDataType2RasterBufferType(oGroup.mpoWriter->GetDataType()),
                                static_cast<unsigned int>(oGroup.moPositions.size())});
        }
        moMerger.emplace(oSources, krv::gobs::QRFDataType2RasterBufferType(moType), oPlaces);
    }
    ForEachBand(oRect, mnBlockHeight,
                [&](const PixelRect& oBand)
                {
                    Parts oParts(moGroups, oBand);
                    for (std::size_t nGroup = 0; nGroup < moGroups.size(); ++nGroup)
                        moGroups[nGroup].mpoWriter->ReadRaster(&oParts.Get(nGroup));
                    unsigned char* const pBand = pTarget + (oBand.mnY - oRect.mnY) * nPitch;
                    ForEachRun(
                        oBand, mnPixelBytes, nPitch,
                        [&](std::size_t nRow, std::uint64_t nPixels)
                        { moMerger->Run(oParts.GetRow<const unsigned char>(nRow), pBand + nRow * nPitch, nPixels); });
                });
}

// A strict writer converts everything before it writes anything.
void MultiTypeIO::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    if (mpoChanges->mbStrict)
        return WriteBand(oRect, pSource, nPitch);
    ForEachBand(oRect, mbMemory ? MemoryTiles::TILE_SIZE : mnBlockHeight,
                [&](const PixelRect& oBand)
                {
                    const unsigned char* const pBand = pSource + (oBand.mnY - oRect.mnY) * nPitch;
                    if (!mbMemory || !WriteInPlace(oBand, pBand, nPitch))
                        WriteBand(oBand, pBand, nPitch);
                });
}

// Straight to where the pixels stay, row by row through all tiles of a band, so that the source is read in its order.
// False, and nothing is done, where a group has them otherwise.
bool MultiTypeIO::WriteInPlace(const PixelRect& oBand, const unsigned char* pSource, std::size_t nPitch)
{
    struct Piece
    {
        PixelRect moRect;
        std::vector<unsigned char*> moTargets;
        std::vector<std::size_t> moPitches;
    };
    std::vector<Piece> oPieces;
    bool bInPlace = true, bTight = nPitch == oBand.mnWidth * mnPixelBytes;
    ForEachPiece(oBand,
                 [&](const PixelRect& oRect)
                 {
                     Piece& oPiece = oPieces.emplace_back(Piece{oRect, {}, {}});
                     for (const WriterGroup& oGroup : moGroups)
                     {
                         std::size_t nOwn = 0;
                         oPiece.moTargets.push_back(oGroup.mpoMemory->BeginWriting(oRect, nOwn));
                         oPiece.moPitches.push_back(nOwn);
                         bInPlace = bInPlace && oPiece.moTargets.back() != nullptr;
                         bTight = bTight && nOwn == oBand.mnWidth * oGroup.moPositions.size() *
                                                        (oGroup.mpoWriter->GetDataType().GetValueBits() / 8);
                     }
                 });
    if (!bInPlace)
        return false;
    std::vector<std::uint64_t> oChanged(moSplitPositions.size());
    const unsigned int nRuns = bTight ? 1 : oBand.mnHeight, nRows = oBand.mnHeight / nRuns;
    std::vector<unsigned char*> oRow(moGroups.size());
    for (unsigned int nRun = 0; nRun < nRuns; ++nRun)
        for (const Piece& oPiece : oPieces)
        {
            for (std::size_t n = 0; n < oRow.size(); ++n)
                oRow[n] = oPiece.moTargets[n] + nRun * oPiece.moPitches[n];
            moSplitter->Run(pSource + nRun * nPitch + (oPiece.moRect.mnX - oBand.mnX) * mnPixelBytes, oRow,
                            std::uint64_t{oPiece.moRect.mnWidth} * nRows, oChanged.data());
        }
    TakeChanges(oBand, oChanged);
    return true;
}

void MultiTypeIO::WriteBand(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    Parts oParts(moGroups, oRect);
    std::vector<std::uint64_t> oChanged(moSplitPositions.size());
    ForEachRun(
        oRect, mnPixelBytes, nPitch,
        [&](std::size_t nRow, std::uint64_t nPixels)
        { moSplitter->Run(pSource + nRow * nPitch, oParts.GetRow<unsigned char>(nRow), nPixels, oChanged.data()); });
    TakeChanges(oRect, oChanged);
    for (std::size_t nGroup = 0; nGroup < moGroups.size(); ++nGroup)
        moGroups[nGroup].mpoWriter->WriteRaster(&oParts.Get(nGroup));
}

void MultiTypeIO::TakeChanges(const PixelRect& oRect, const std::vector<std::uint64_t>& oChanged)
{
    for (std::size_t n = 0; n < oChanged.size() && mpoChanges->mbStrict; ++n)
    {
        if (oChanged[n] == 0)
            continue;
        const unsigned int nPosition = moSplitPositions[n];
        for (const WriterGroup& oGroup : moGroups)
            for (const unsigned int nOwn : oGroup.moPositions)
                if (nOwn == nPosition)
                    throw krv::DataException(
                        "Channel " + std::to_string(mpoChanges->moChannels[nPosition]) + " is of the type " +
                        oGroup.mpoWriter->GetDataType().Describe() + ", which does not hold " +
                        std::to_string(oChanged[n]) + " of the samples of type " + moType.Describe() + " at " +
                        std::to_string(oRect.mnX) + ", " + std::to_string(oRect.mnY) + "; nothing was written");
    }
    for (std::size_t n = 0; n < oChanged.size(); ++n)
        mpoChanges->moCounts[moSplitPositions[n]] += oChanged[n];
}

} // namespace krv::datasources::detail
