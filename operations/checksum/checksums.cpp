#include "operations/checksum/checksums.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/raster/raster.h"
#include "operations/source/sourcefile.h"

#include <libdeflate.h>

#include <algorithm>
#include <bit>
#include <cstring>
#include <memory>

static_assert(std::endian::native == std::endian::little, "checksums are over little-endian values");

namespace krv::operations
{

namespace
{

// Moves a value of 16 bytes as a whole; smaller ones are integers.
struct Wide
{
    std::uint64_t low;
    std::uint64_t high;
};

// The usual channel counts are spelt out, so that the compiler turns them into shuffles of vectors.
template <typename Sample, unsigned int CHANNELS>
void SplitRow(const unsigned char* pPixels, std::size_t nPixels, unsigned char* const* ppPlanes)
{
    const Sample* __restrict pFrom = reinterpret_cast<const Sample*>(pPixels);
    Sample* __restrict p0 = reinterpret_cast<Sample*>(ppPlanes[0]);
    Sample* __restrict p1 = reinterpret_cast<Sample*>(ppPlanes[1]);
    Sample* __restrict p2 = reinterpret_cast<Sample*>(ppPlanes[CHANNELS > 2 ? 2 : 0]);
    Sample* __restrict p3 = reinterpret_cast<Sample*>(ppPlanes[CHANNELS > 3 ? 3 : 0]);
    for (std::size_t i = 0; i < nPixels; ++i)
    {
        p0[i] = pFrom[i * CHANNELS];
        p1[i] = pFrom[i * CHANNELS + 1];
        if constexpr (CHANNELS > 2)
            p2[i] = pFrom[i * CHANNELS + 2];
        if constexpr (CHANNELS > 3)
            p3[i] = pFrom[i * CHANNELS + 3];
    }
}

template <typename Sample>
void SplitRow(const unsigned char* pPixels, std::size_t nPixels, unsigned int nChannels, unsigned char* const* ppPlanes)
{
    const auto* pFrom = reinterpret_cast<const Sample*>(pPixels);
    for (unsigned int c = 0; c < nChannels; ++c)
    {
        auto* const pTo = reinterpret_cast<Sample*>(ppPlanes[c]);
        for (std::size_t i = 0; i < nPixels; ++i)
            pTo[i] = pFrom[i * nChannels + c];
    }
}

using SplitFunction = void (*)(const unsigned char*, std::size_t, unsigned int, unsigned char* const*);

template <typename Sample>
void Split(const unsigned char* pPixels, std::size_t nPixels, unsigned int nChannels, unsigned char* const* ppPlanes)
{
    if (nChannels == 1)
        std::memcpy(ppPlanes[0], pPixels, nPixels * sizeof(Sample));
    else if (nChannels == 2)
        SplitRow<Sample, 2>(pPixels, nPixels, ppPlanes);
    else if (nChannels == 3)
        SplitRow<Sample, 3>(pPixels, nPixels, ppPlanes);
    else if (nChannels == 4)
        SplitRow<Sample, 4>(pPixels, nPixels, ppPlanes);
    else
        SplitRow<Sample>(pPixels, nPixels, nChannels, ppPlanes);
}

SplitFunction SplitFor(std::size_t nValueBytes)
{
    switch (nValueBytes)
    {
    case 1:
        return &Split<std::uint8_t>;
    case 2:
        return &Split<std::uint16_t>;
    case 4:
        return &Split<std::uint32_t>;
    case 8:
        return &Split<std::uint64_t>;
    default:
        return &Split<Wide>;
    }
}

// Pixels that follow each other in row-major order, one plane per channel.
class Band
{
public:
    Band(unsigned int nWidth, unsigned int nRows, unsigned int nChannels, std::size_t nValueBytes)
        : mnPitch(static_cast<std::size_t>(nWidth) * nValueBytes), mnValueBytes(nValueBytes),
          moPlanes(nChannels, std::vector<unsigned char>(mnPitch * nRows)), moTargets(nChannels),
          mpSplit(SplitFor(nValueBytes))
    {
    }

    // nColumn: where the tile's first column lies in the band.
    void Take(const krv::gobs::Raster& oTile, unsigned int nColumn)
    {
        const unsigned int nChannels = oTile.GetChansCount();
        const std::size_t nRowBytes = static_cast<std::size_t>(oTile.GetWidth()) * nChannels * mnValueBytes;
        for (unsigned int r = 0; r < oTile.GetHeight(); ++r)
        {
            for (unsigned int c = 0; c < nChannels; ++c)
                moTargets[c] = moPlanes[c].data() + r * mnPitch + nColumn * mnValueBytes;
            mpSplit(oTile.GetBuffer() + r * nRowBytes, oTile.GetWidth(), nChannels, moTargets.data());
        }
    }

    void Update(std::vector<std::uint32_t>& oSums, std::uint64_t nPixels) const
    {
        for (std::size_t c = 0; c < oSums.size(); ++c)
            oSums[c] = libdeflate_crc32(oSums[c], moPlanes[c].data(), nPixels * mnValueBytes);
    }

private:
    std::size_t mnPitch;
    std::size_t mnValueBytes;
    std::vector<std::vector<unsigned char>> moPlanes;
    std::vector<unsigned char*> moTargets;
    SplitFunction mpSplit;
};

// The format's own blocks, with fewer rows where a row of them is too large, and fewer columns where a row of pixels
// is.
void BoundTiles(krv::datasources::IRasterReader& oReader)
{
    const std::uint64_t nPixelBytes = krv::gobs::BufferBytes(1, 1, oReader.GetChansCount(), oReader.GetDataType());
    const std::uint64_t nMostPixels =
        std::max<std::uint64_t>(MAX_BAND_BYTES / std::max<std::uint64_t>(nPixelBytes, 1), 1);
    const std::uint64_t nMostRows = std::max<std::uint64_t>(nMostPixels / std::max(oReader.GetWidth(), 1U), 1);
    const std::uint64_t nWidth = std::clamp(oReader.GetTileWidth(), 1U, std::max(oReader.GetWidth(), 1U));
    const std::uint64_t nHeight = std::clamp(oReader.GetTileHeight(), 1U, std::max(oReader.GetHeight(), 1U));
    oReader.SetTileSize(static_cast<unsigned int>(std::min(nWidth, nMostPixels)),
                        static_cast<unsigned int>(std::min(nHeight, nMostRows)));
    oReader.SetMargins(0, 0, eMirror);
}

} // namespace

std::vector<std::uint32_t> ComputeChecksums(krv::datasources::IRasterReader& oReader, const Progress& oProgress)
{
    BoundTiles(oReader);
    const unsigned int nWidth = oReader.GetWidth(), nChannels = oReader.GetChansCount();
    // Tiles of full width or of one row follow each other as the pixels do; others are gathered to full rows.
    const bool bInOrder = oReader.GetTileWidth() == nWidth || oReader.GetTileHeight() == 1;
    const bool bDirect = bInOrder && nChannels == 1;
    const unsigned int nBandWidth = bInOrder ? oReader.GetTileWidth() : nWidth;
    Band oBand(bDirect ? 0 : nBandWidth, oReader.GetTileHeight(), nChannels,
               static_cast<std::size_t>(oReader.GetDataType().GetValueBits() / 8));
    std::vector<std::uint32_t> oSums(nChannels, 0);
    ProgressCounter oCounter(oProgress, "checksum",
                             krv::gobs::BufferBytes(nWidth, oReader.GetHeight(), nChannels, oReader.GetDataType()));
    for (const std::unique_ptr<krv::gobs::Raster> poTile : krv::datasources::RasterRange(oReader))
    {
        const unsigned int nX = static_cast<unsigned int>(poTile->GetX());
        if (bDirect)
            oSums[0] = libdeflate_crc32(oSums[0], poTile->GetBuffer(), poTile->GetBufferSize());
        else
            oBand.Take(*poTile, bInOrder ? 0 : nX);
        const std::uint64_t nTileWidth = poTile->GetWidth();
        if (!bDirect && (bInOrder || nX + nTileWidth == nWidth))
            oBand.Update(oSums, poTile->GetHeight() * (bInOrder ? nTileWidth : nWidth));
        oCounter.Advance(poTile->GetBufferSize());
    }
    return oSums;
}

Checksums ComputeChecksums(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, unsigned int nLevel,
                           const Progress& oProgress)
{
    const auto oWanted = oFile.CheckChannels(oChannels);
    Checksums oResult;
    oResult.channels.resize(oWanted.size());
    for (const ChannelGroup& oGroup : oFile.GroupByType(oWanted))
    {
        const LevelReader oReader = oFile.Read(oGroup.channels, nLevel);
        oResult.width = oReader.Get().GetWidth();
        oResult.height = oReader.Get().GetHeight();
        const auto oSums = ComputeChecksums(oReader.Get(), oProgress);
        for (std::size_t i = 0; i < oSums.size(); ++i)
            oResult.channels[oGroup.positions[i]] = {oGroup.channels[i], oReader.Get().GetDataType(), oSums[i]};
    }
    return oResult;
}

} // namespace krv::operations
