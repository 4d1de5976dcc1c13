#include "operations/checksum/checksums.h"

#include "datasources/reader/irasterreader.h"
#include "gobs/raster/raster.h"
#include "operations/checksum/detail/tilechecksum.h"
#include "operations/source/fileworkers.h"
#include "operations/source/sourcefile.h"
#include "toolkit/threading/foreachitem.h"

#include <algorithm>
#include <memory>

namespace krv::operations
{

namespace
{

using detail::TileChecksum;
using krv::datasources::IRasterReader;

// The format's own blocks, with fewer rows where a block is too large, and fewer columns where a row of it is.
void BoundTiles(IRasterReader& oReader)
{
    const std::uint64_t nPixelBytes = krv::gobs::BufferBytes(1, 1, oReader.GetChansCount(), oReader.GetDataType());
    const std::uint64_t nMostPixels =
        std::max<std::uint64_t>(MAX_TILE_BYTES / std::max<std::uint64_t>(nPixelBytes, 1), 1);
    const std::uint64_t nWidth =
        std::min<std::uint64_t>(std::clamp(oReader.GetTileWidth(), 1U, std::max(oReader.GetWidth(), 1U)), nMostPixels);
    const std::uint64_t nHeight = std::clamp(oReader.GetTileHeight(), 1U, std::max(oReader.GetHeight(), 1U));
    oReader.SetTileSize(static_cast<unsigned int>(nWidth),
                        static_cast<unsigned int>(std::min(nHeight, std::max<std::uint64_t>(nMostPixels / nWidth, 1))));
    oReader.SetMargins(0, 0, eMirror);
}

// What a tile adds to the sums of all channels.
struct Share
{
    std::vector<std::uint32_t> sums;
    std::uint64_t bytes;
};

Share ShareOf(IRasterReader& oReader, std::uint64_t nTile, const TileChecksum& oSums,
              std::vector<unsigned char>& oScratch)
{
    const std::unique_ptr<krv::gobs::Raster> poTile(oReader.GetRaster(static_cast<unsigned int>(nTile)));
    return {oSums.Compute(*poTile, oScratch), poTile->GetBufferSize()};
}

// The sums while they grow.
class Total
{
public:
    Total(const IRasterReader& oReader, const Progress& oProgress)
        : moSums(oReader.GetChansCount(), 0),
          moCounter(oProgress, "checksum",
                    krv::gobs::BufferBytes(oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(),
                                           oReader.GetDataType()))
    {
    }

    void Add(const Share& oShare)
    {
        for (std::size_t c = 0; c < moSums.size(); ++c)
            moSums[c] ^= oShare.sums[c];
        moCounter.Advance(oShare.bytes);
    }
    const ProgressCounter& GetCounter() const { return moCounter; }
    const std::vector<std::uint32_t>& Get() const { return moSums; }

private:
    std::vector<std::uint32_t> moSums;
    ProgressCounter moCounter;
};

struct Worker
{
    FilePointer file;
    LevelReader reader;
    std::vector<unsigned char> scratch;
};

} // namespace

std::vector<std::uint32_t> ComputeChecksums(IRasterReader& oReader, const Progress& oProgress)
{
    BoundTiles(oReader);
    const TileChecksum oTileSums(oReader);
    Total oTotal(oReader, oProgress);
    std::vector<unsigned char> oScratch;
    for (unsigned int nTile = 0; nTile < oReader.GetTileCount(); ++nTile)
        oTotal.Add(ShareOf(oReader, nTile, oTileSums, oScratch));
    return oTotal.Get();
}

Checksums ComputeChecksums(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, unsigned int nLevel,
                           const Progress& oProgress, krv::threading::IExecutor* poExecutor)
{
    const auto oWanted = oFile.CheckChannels(oChannels);
    Checksums oResult;
    oResult.channels.resize(oWanted.size());
    for (const ChannelGroup& oGroup : oFile.GroupByType(oWanted))
    {
        const LevelReader oFirst = oFile.Read(oGroup.channels, nLevel);
        const IRasterReader& oReader = oFirst.Get();
        BoundTiles(oFirst.Get());
        oResult.width = oReader.GetWidth();
        oResult.height = oReader.GetHeight();
        const TileChecksum oTileSums(oReader);
        Total oTotal(oReader, oProgress);
        FileWorkers<Worker> oWorkers(oFile,
                                     [&](FilePointer poFile)
                                     {
                                         LevelReader oOwn = poFile->Read(oGroup.channels, nLevel);
                                         BoundTiles(oOwn.Get());
                                         return std::make_unique<Worker>(std::move(poFile), std::move(oOwn));
                                     });
        krv::threading::TaskGroup oThreads(poExecutor, [&oTotal] { oTotal.GetCounter().Repeat(); });
        krv::threading::ForEachItem(
            oThreads, oReader.GetTileCount(),
            [&](std::uint64_t nTile)
            {
                const FileWorkers<Worker>::Use oWorker(oWorkers);
                return ShareOf(oWorker->reader.Get(), nTile, oTileSums, oWorker->scratch);
            },
            [&](const Share& oShare) { oTotal.Add(oShare); });
        for (std::size_t i = 0; i < oTotal.Get().size(); ++i)
            oResult.channels[oGroup.positions[i]] = {oGroup.channels[i], oReader.GetDataType(), oTotal.Get()[i]};
    }
    return oResult;
}

} // namespace krv::operations
