// filterscene SCENE RESULT: smooths the first 8-bit channel on all cores, without seams; Ctrl-C leaves nothing.
#include <csignal>
#include <iostream>
#include <krv/krv.h>
static volatile std::sig_atomic_t gnStopped = 0;
static std::unique_ptr<krv::Raster> Smooth(std::unique_ptr<krv::Raster> poTile) // on any thread
{
    auto poResult =
        std::make_unique<krv::Raster>(poTile->GetInfo(), krv::RasterContext(poTile->GetX(), poTile->GetY()));
    const krv::RasterView<const unsigned char> oFrom(*poTile);
    const auto nWidth = static_cast<int>(poTile->GetWidth());
    for (int n = 0, nSum = 0; n < nWidth * static_cast<int>(poTile->GetHeight()); ++n, nSum = 0)
    {
        for (int i = 0; i < 9; ++i)
            nSum += oFrom.At(n % nWidth + i % 3 - 1, n / nWidth + i / 3 - 1, 0);
        poResult->GetBuffer()[n] = static_cast<unsigned char>(nSum / 9);
    }
    return poResult;
}
static bool Show(unsigned int n, unsigned int nAll)
{
    return (std::cerr << n << '/' << nAll << '\r') && gnStopped == 0;
}
int main(int, char** pFiles)
{
    std::signal(SIGINT, [](int) { gnStopped = 1; });
    const auto Open = [pFiles] // one for each thread
    {
        return krv::OpenHaloReader(pFiles[1], {1}, 1);
    };
    const auto poScene = Open();
    const krv::RasterInfo oInfo(poScene->GetWidth(), poScene->GetHeight(), 1, krv::eDT_8U);
    const auto poWriter = krv::CreateWriter(pFiles[2], oInfo, "TIF", "COMPRESS=DEFLATE");
    krv::CopyAllButPixels(*poScene, *poWriter);
    krv::ThreadPool oThreads;
    if (krv::WriteTiles(Open, Smooth, *poWriter, {&oThreads, {}, Show}))
        poWriter->Synchronize();
}
