// Smooths the first channel of an 8-bit scene on all cores, without seams; Ctrl-C stops it and leaves nothing.
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/tilewriting.h"
#include "gobs/raster/rasterview.h"
#include "toolkit/threading/threadpool.h"
#include <csignal>
#include <iostream>
using namespace krv::datasources;
using namespace krv::gobs;
static volatile std::sig_atomic_t gnStopped = 0;
static std::unique_ptr<Raster> Smooth(std::unique_ptr<Raster> poTile) // on any thread
{
    auto poResult = std::make_unique<Raster>(poTile->GetInfo(), RasterContext(poTile->GetX(), poTile->GetY()));
    const RasterView<const unsigned char> oFrom(*poTile);
    const int nWidth = static_cast<int>(poTile->GetWidth());
    for (int n = 0, nSum = 0; n < nWidth * static_cast<int>(poTile->GetHeight()); ++n, nSum = 0)
    {
        for (int i = 0; i < 9; ++i)
            nSum += oFrom.At(n % nWidth + i % 3 - 1, n / nWidth + i / 3 - 1, 0);
        poResult->GetBuffer()[n] = static_cast<unsigned char>(nSum / 9);
    }
    return poResult;
}
int main(int, char** pFiles)
{
    std::signal(SIGINT, [](int) { gnStopped = 1; });
    const auto oReaders = MakeExactReaders(pFiles[1], {1}, 1, 1, eMirror);
    const auto poScene = oReaders();
    BasicWriter oWriter(pFiles[2], {1}, "TIF", "COMPRESS=DEFLATE");
    oWriter.CreateNewFile({poScene->GetWidth(), poScene->GetHeight(), 1, eDT_8U});
    krv::threading::ThreadPool oThreads;
    TileJob oJob{&oThreads};
    oJob.moProgress = [](unsigned int n, unsigned int nAll)
    {
        return (std::cerr << n << '/' << nAll << '\r') && gnStopped == 0;
    };
    if (WriteTiles(oReaders, Smooth, oWriter, oJob))
        oWriter.Synchronize();
}
