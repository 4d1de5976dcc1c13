#include "datasources/writer/detail/multitypeio.h"

#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hblock.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/simd/streamcopy.h"

#include <algorithm>
#include <numeric>
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

// What a caller writes at once goes past the caches from here on: the caches of a core hold little more, and memcpy of
// as much does so too. Measured: 1.3 times as fast for tiles of 1024.
constexpr std::uint64_t STREAMED_BYTES = 256 * 1024;
// Pixels that are converted at a time before they go there: few enough for the nearest cache.
constexpr std::uint64_t MOST_STREAMED = 1024;
constexpr std::uint64_t STREAM_STEP = 64;
constexpr std::uint64_t STREAM_BYTES = 16 * 1024;

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
        moOwnBytes.push_back(oGroup.moPositions.size() * (oGroup.mpoWriter->GetDataType().GetValueBits() / 8));
        mnBlockHeight = std::max(mnBlockHeight, oGroup.mpoWriter->GetTileHeight());
        mbMemory = mbMemory && oGroup.mpoMemory != nullptr;
        moSplitPositions.insert(moSplitPositions.end(), oGroup.moPositions.begin(), oGroup.moPositions.end());
    }
    mnStreamed = std::clamp(STREAM_BYTES / std::max<std::uint64_t>(SumOwnBytes(), 1) / STREAM_STEP * STREAM_STEP,
                            STREAM_STEP, MOST_STREAMED);
    for (std::size_t n = 0; mbMemory && n < moGroups.size(); ++n)
        moStreamTargets.push_back(moStreamed.emplace_back(moOwnBytes[n] * mnStreamed).data());
    mnPixelBytes = moSplitPositions.size() * (oType.GetValueBits() / 8);
    moSplitter.emplace(krv::gobs::QRFDataType2RasterBufferType(oType),
                       static_cast<unsigned int>(moSplitPositions.size()), oTargets);
}

MultiTypeIO::~MultiTypeIO() = default;

std::uint64_t MultiTypeIO::SumOwnBytes() const
{
    return std::accumulate(moOwnBytes.begin(), moOwnBytes.end(), std::uint64_t{0});
}

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
    const bool bStream = std::uint64_t{oRect.mnWidth} * oRect.mnHeight * SumOwnBytes() >= STREAMED_BYTES;
    ForEachBand(oRect, mbMemory ? MemoryTiles::TILE_SIZE : mnBlockHeight,
                [&](const PixelRect& oBand)
                {
                    const unsigned char* const pBand = pSource + (oBand.mnY - oRect.mnY) * nPitch;
                    if (!mbMemory || !WriteInPlace(oBand, pBand, nPitch, bStream))
                        WriteBand(oBand, pBand, nPitch);
                });
}

// Straight to where the pixels stay, row by row through all tiles of a band, so that the source is read in its order.
// False, and nothing is done, where a group has them otherwise.
bool MultiTypeIO::WriteInPlace(const PixelRect& oBand, const unsigned char* pSource, std::size_t nPitch, bool bStream)
{
    std::vector<Piece> oPieces;
    bool bInPlace = true, bTight = nPitch == oBand.mnWidth * mnPixelBytes;
    ForEachPiece(oBand,
                 [&](const PixelRect& oRect)
                 {
                     Piece& oPiece = oPieces.emplace_back(Piece{oRect.mnX - oBand.mnX, oRect.mnWidth, {}, {}});
                     for (std::size_t n = 0; n < moGroups.size(); ++n)
                     {
                         std::size_t nOwn = 0;
                         oPiece.moTargets.push_back(moGroups[n].mpoMemory->BeginWriting(oRect, nOwn));
                         oPiece.moPitches.push_back(nOwn);
                         bInPlace = bInPlace && oPiece.moTargets.back() != nullptr;
                         bTight = bTight && nOwn == oBand.mnWidth * moOwnBytes[n];
                     }
                 });
    if (!bInPlace)
        return false;
    bTight = bTight && oPieces.size() == 1;
    std::vector<std::uint64_t> oChanged(moSplitPositions.size());
    const unsigned int nRuns = bTight ? 1 : oBand.mnHeight, nRows = oBand.mnHeight / nRuns;
    for (Piece& oPiece : oPieces)
        oPiece.mnPixels *= nRows;
    for (unsigned int nRun = 0; nRun < nRuns; ++nRun, pSource += nPitch)
    {
        if (bStream)
            StreamRun(oPieces, pSource, std::uint64_t{oBand.mnWidth} * nRows, oChanged);
        for (std::size_t n = 0; !bStream && n < oPieces.size(); ++n)
            moSplitter->Run(pSource + oPieces[n].mnFirst * mnPixelBytes, oPieces[n].moTargets, oPieces[n].mnPixels,
                            oChanged.data());
        for (Piece& oPiece : oPieces)
            for (std::size_t n = 0; n < moGroups.size(); ++n)
                oPiece.moTargets[n] += oPiece.moPitches[n];
    }
    if (bStream)
        krv::simd::FinishStreams();
    TakeChanges(oBand, oChanged);
    return true;
}

// Pixels without gaps between them, a few at a time that stay in the nearest cache, then on to their pieces.
void MultiTypeIO::StreamRun(const std::vector<Piece>& oPieces, const unsigned char* pSource, std::uint64_t nPixels,
                            std::vector<std::uint64_t>& oChanged)
{
    auto oPiece = oPieces.begin();
    for (std::uint64_t nFirst = 0; nFirst < nPixels; nFirst += mnStreamed)
    {
        const std::uint64_t nEnd = std::min(nFirst + mnStreamed, nPixels);
        krv::simd::Fetch(pSource + nEnd * mnPixelBytes, (nEnd - nFirst) * mnPixelBytes);
        moSplitter->Run(pSource + nFirst * mnPixelBytes, moStreamTargets, nEnd - nFirst, oChanged.data());
        for (std::uint64_t nAt = nFirst; nAt < nEnd;)
        {
            const std::uint64_t nPieceEnd = oPiece->mnFirst + oPiece->mnPixels, nUpTo = std::min(nEnd, nPieceEnd);
            for (std::size_t n = 0; n < moGroups.size(); ++n)
                krv::simd::StreamCopy(oPiece->moTargets[n] + (nAt - oPiece->mnFirst) * moOwnBytes[n],
                                      moStreamTargets[n] + (nAt - nFirst) * moOwnBytes[n],
                                      (nUpTo - nAt) * moOwnBytes[n]);
            oPiece += nUpTo == nPieceEnd ? 1 : 0;
            nAt = nUpTo;
        }
    }
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
