#include "datasources/reader/tilework.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/threading/foreachitem.h"
#include "toolkit/threading/statestore.h"

namespace krv::datasources::detail
{

namespace
{

struct Stopped
{
};

} // namespace

bool RunTiles(const ReaderFactory& oMakeReader, const TileTask& oTask, const TileJob& oJob)
{
    const auto Make = [&oMakeReader]
    {
        std::unique_ptr<IRasterReader> poReader = oMakeReader();
        if (poReader == nullptr)
            throw krv::DataException("Tiles cannot be worked on without a reader");
        return poReader;
    };
    krv::threading::StateStore<IRasterReader> oReaders(Make);
    std::unique_ptr<IRasterReader> poFirst = Make();
    const unsigned int nTiles = poFirst->GetTileCount();
    oReaders.Add(std::move(poFirst));
    unsigned int nDone = 0;
    const auto Ask = [&]
    {
        if (oJob.moProgress && !oJob.moProgress(nDone, nTiles))
            throw Stopped();
    };
    const auto Work = [&](std::uint64_t nTile)
    {
        std::unique_ptr<krv::gobs::Raster> poTile;
        {
            const krv::threading::StateStore<IRasterReader>::Use oReader(oReaders);
            poTile.reset(oReader->GetRaster(static_cast<unsigned int>(nTile)));
        }
        return oTask(std::move(poTile));
    };
    const auto Take = [&](const std::function<void()>& oTake)
    {
        oTake();
        ++nDone;
        Ask();
    };
    try
    {
        Ask();
        krv::threading::TaskGroup oGroup(oJob.mpoExecutor, Ask);
        krv::threading::ForEachItem(oGroup, nTiles, Work, Take, oJob.meOrder);
        return true;
    }
    catch (const Stopped&)
    {
        return false;
    }
}

} // namespace krv::datasources::detail
