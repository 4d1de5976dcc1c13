#pragma once

#include "datasources/api.h"
#include "datasources/reader/irasterreader.h"
#include "gobs/raster/raster.h"
#include "toolkit/threading/executor.h"
#include "toolkit/threading/taskgroup.h"

#include <functional>
#include <memory>
#include <type_traits>
#include <utility>

namespace krv::datasources
{

// Makes a reader for one thread, over a dataset of its own, with tile size and margins set; all that it makes are
// alike. Called by any of the threads, by several at once. The first call is made by the thread that starts the work.
// Example: [] { return krv::OpenHaloReader("scene.tif", {1}, 8); }
using ReaderFactory = std::function<std::unique_ptr<IRasterReader>()>;

struct TileJob
{
    // Whose threads work beside the calling one; borrowed. Null: the calling one alone.
    krv::threading::IExecutor* mpoExecutor = nullptr;
    // Results are taken in the order of the tiles, or as they come.
    krv::threading::TaskOrder meOrder = krv::threading::TaskOrder::eAsAdded;
    // Called by the calling thread with the tiles that are done and all of them, at least every 50 ms or after each
    // tile that it works on itself. False stops the work. May throw.
    std::function<bool(unsigned int nDone, unsigned int nTotal)> moProgress;
};

namespace detail
{

// The work on a tile gives what is to be done with its result.
using TileTask = std::function<std::function<void()>(std::unique_ptr<krv::gobs::Raster>)>;

KRV_DATASOURCES_API bool RunTiles(const ReaderFactory& oMakeReader, const TileTask& oTask, const TileJob& oJob);

} // namespace detail

// Reads each tile once and makes a result of it by oWork(std::unique_ptr<Raster>), on any thread, several tiles at
// once; oTake(result) gets them one by one in the calling thread. Tiles are read ahead while others are worked on;
// results that wait are bounded, to two for each thread. False when the progress function stopped it. The first
// exception in the order of taking ends all and passes. Nothing runs any more when this returns.
// Example: the mean of an image on all cores:
//   ThreadPool oPool;
//   ForEachTile(oMake, [](auto poTile) { return SumOf(*poTile); }, [&](double nSum) { nTotal += nSum; }, {&oPool});
// oWork may keep or change its tile; it touches nothing that is shared, or locks it.
template <typename Work, typename Take>
bool ForEachTile(const ReaderFactory& oMakeReader, Work oWork, Take oTake, const TileJob& oJob = {})
{
    const auto RunOne = [&](std::unique_ptr<krv::gobs::Raster> poTile) -> std::function<void()>
    {
        using Result = std::invoke_result_t<Work&, std::unique_ptr<krv::gobs::Raster>>;
        const auto poResult = std::make_shared<Result>(oWork(std::move(poTile)));
        return [&oTake, poResult]
        {
            oTake(std::move(*poResult));
        };
    };
    return detail::RunTiles(oMakeReader, RunOne, oJob);
}

} // namespace krv::datasources
