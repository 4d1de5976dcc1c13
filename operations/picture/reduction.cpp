#include "operations/picture/reduction.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/raster/raster.h"
#include "operations/source/fileworkers.h"
#include "toolkit/threading/foreachitem.h"

#include <memory>

namespace krv::operations
{

using krv::gobs::PlaneReducer;
using krv::gobs::Raster;

namespace
{

struct Worker
{
    FilePointer file;
    LevelReader reader;
};

// What a tile adds to the planes.
struct Share
{
    std::shared_ptr<const PlaneReducer::Sums> sums;
    std::uint64_t bytes;
};

} // namespace

std::vector<Plane> Reduce(krv::datasources::IRasterReader& oReader, const krv::gobs::NoDataNumbers& oNumbers,
                          unsigned int nWidth, unsigned int nHeight, Resampling eMethod, ProgressCounter& oCounter)
{
    PlaneReducer oReducer(oReader.GetDataType(), oReader.GetWidth(), oReader.GetHeight(), nWidth, nHeight, oNumbers,
                          eMethod);
    oReader.SetMargins(0, 0, eMirror);
    for (const std::unique_ptr<Raster> poTile : krv::datasources::RasterRange(oReader))
    {
        oReducer.Add(*poTile);
        oCounter.Advance(poTile->GetBufferSize());
    }
    return oReducer.TakePlanes();
}

std::vector<Plane> Reduce(const SourceFile& oFile, const MakeLevelReader& oRead,
                          const krv::gobs::NoDataNumbers& oNumbers, unsigned int nWidth, unsigned int nHeight,
                          Resampling eMethod, ProgressCounter& oCounter, krv::threading::IExecutor* poExecutor)
{
    FileWorkers<Worker> oWorkers(oFile,
                                 [&oRead](FilePointer poFile)
                                 {
                                     LevelReader oReader = oRead(*poFile);
                                     oReader.Get().SetMargins(0, 0, eMirror);
                                     return std::make_unique<Worker>(std::move(poFile), std::move(oReader));
                                 });
    const LevelReader oWhole = oRead(oFile);
    const krv::datasources::IRasterReader& oReader = oWhole.Get();
    PlaneReducer oReducer(oReader.GetDataType(), oReader.GetWidth(), oReader.GetHeight(), nWidth, nHeight, oNumbers,
                          eMethod);
    krv::threading::TaskGroup oThreads(poExecutor, [&oCounter] { oCounter.Repeat(); });
    krv::threading::ForEachItem(
        oThreads, oReader.GetTileCount(),
        [&](std::uint64_t nTile)
        {
            const FileWorkers<Worker>::Use oWorker(oWorkers);
            const std::unique_ptr<Raster> poTile(oWorker->reader.Get().GetRaster(static_cast<unsigned int>(nTile)));
            return Share{oReducer.Sum(*poTile), poTile->GetBufferSize()};
        },
        [&](const Share& oShare)
        {
            oReducer.Add(*oShare.sums);
            oCounter.Advance(oShare.bytes);
        });
    return oReducer.TakePlanes();
}

} // namespace krv::operations
