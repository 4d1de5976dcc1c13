// Smooths the first channel of an 8-bit scene on all cores, without seams; Ctrl-C stops it and leaves nothing.
#include "datasources/reader/basicreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/tilework.h"
#include "datasources/writer/basicwriter.h"
#include "toolkit/threading/threadpool.h"
#include <csignal>
#include <iostream>
using namespace krv::datasources;
using krv::gobs::Raster, krv::gobs::RasterContext;
using Tile = std::unique_ptr<Raster>;
static volatile std::sig_atomic_t gnStopped = 0;
static std::unique_ptr<IRasterReader> MakeReader(const char* pFile) // one for each thread
{
    auto poReader = std::make_unique<ExactHaloReader>(new BasicReader(pFile, {1}), true);
    poReader->SetMargins(1, 1, eMirror);
    return poReader;
}
static Tile Smooth(Tile poTile) // on any thread
{
    auto poResult = std::make_unique<Raster>(poTile->GetInfo(), RasterContext(poTile->GetX(), poTile->GetY()));
    const unsigned int nWidth = poTile->GetWidth();
    for (std::size_t n = 0; n < poResult->GetBufferSize(); ++n)
        for (unsigned int i = 0, nSum = 0; i < 9; ++i, poResult->GetBuffer()[n] = static_cast<unsigned char>(nSum / 9))
            nSum += poTile->GetBuffer()[(n / nWidth + i / 3) * (nWidth + 2) + n % nWidth + i % 3];
    return poResult;
}
static bool Show(unsigned int n, unsigned int nAll)
{
    return std::cerr << n << '/' << nAll << '\r', gnStopped == 0;
}
int main(int, char** pArguments)
{
    std::signal(SIGINT, [](int) { gnStopped = 1; });
    BasicWriter oWriter(pArguments[2], {1}, "TIF", "COMPRESS=DEFLATE");
    const auto poWhole = MakeReader(pArguments[1]);
    oWriter.CreateNewFile({poWhole->GetWidth(), poWhole->GetHeight(), 1, krv::gobs::eDT_8U});
    krv::threading::ThreadPool oThreads;
    const TileJob oJob{&oThreads, {}, Show};
    const auto Store = [&](const Tile& poTile)
    {
        oWriter.WriteRaster(poTile.get());
    };
    if (ForEachTile([&] { return MakeReader(pArguments[1]); }, Smooth, Store, oJob))
        oWriter.Synchronize();
}
