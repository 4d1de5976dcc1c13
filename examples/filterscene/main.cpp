// filterscene SCENE RESULT: smooths the first 8-bit channel on all cores, without seams; Ctrl-C leaves nothing.
#include <csignal>
#include <iostream>
#include <krv/krv.h>
static volatile std::sig_atomic_t gnStopped = 0;
static std::unique_ptr<krv::Raster> Smooth(std::unique_ptr<krv::Raster> poTile) // on any thread
{
    auto poNew = std::make_unique<krv::Raster>(poTile->GetInfo(), krv::RasterContext(poTile->GetX(), poTile->GetY()));
    const krv::RasterView<const unsigned char> oFrom(*poTile);
    const auto nWidth = static_cast<int>(poTile->GetWidth());
    for (int n = 0, nSum = 0; n < nWidth * static_cast<int>(poTile->GetHeight()); ++n, nSum = 0)
    {
        for (int i = 0; i < 9; ++i)
            nSum += oFrom.At(n % nWidth + i % 3 - 1, n / nWidth + i / 3 - 1, 0);
        poNew->GetBuffer()[n] = static_cast<unsigned char>(nSum / 9);
    }
    return poNew;
}
int main(int nArguments, char** pFiles)
try
{
    if (nArguments != 3)
        throw std::invalid_argument("usage: filterscene SCENE RESULT");
    std::signal(SIGINT, [](int) { gnStopped = 1; });
    const auto poScene = krv::OpenReader(pFiles[1], {1});
    const krv::RasterInfo oInfo(poScene->GetWidth(), poScene->GetHeight(), 1, krv::eDT_8U);
    const auto poWriter = krv::CreateWriter(pFiles[2], oInfo, "TIF", "COMPRESS=DEFLATE");
    krv::CopyAllButPixels(*poScene, *poWriter);
    krv::ThreadPool oThreads;
    krv::TileJob oJob;
    oJob.mpoExecutor = &oThreads;
    oJob.moProgress = std::bind([] { return gnStopped == 0; }); // asked after each tile
    const bool bDone = krv::WriteTiles([&] { return krv::OpenHaloReader(pFiles[1], {1}, 1); }, Smooth, *poWriter, oJob);
    return bDone ? (poWriter->Synchronize(), 0) : 130;
}
catch (const std::exception& oError)
{
    return std::cerr << "filterscene: " << oError.what() << '\n', 1;
}
