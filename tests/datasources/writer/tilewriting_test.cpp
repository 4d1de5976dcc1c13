#include "datasources/writer/tilewriting.h"

#include "datasources/reader/exacthaloreader.h"
#include "datasources/utils/open.h"
#include "datasources/writer/basicwriter.h"
#include "tests/datasources/reader/readertest.h"
#include "toolkit/threading/threadpool.h"
#include "tools/conformance/tempfolder.h"

#include <atomic>
#include <chrono>
#include <filesystem>
#include <thread>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using krv::gobs::Raster;
using krv::threading::IExecutor;

constexpr unsigned int WIDTH = 300;
constexpr unsigned int HEIGHT = 200;

class TileWritingThreads : public ReaderTest
{
protected:
    TileWritingThreads()
    {
        moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/tif.so", "<Dataset><SupportsCreate/></Dataset>");
        krv::datasources::DatasetManager::DestroyInstance();
        BasicWriter oWriter(moScene, {1}, "TIF", "TILED=YES BLOCKXSIZE=64 BLOCKYSIZE=48");
        oWriter.CreateNewFile({WIDTH, HEIGHT, 1, krv::gobs::eDT_8U});
        Raster oAll({WIDTH, HEIGHT, 1, krv::gobs::eDT_8U}, {0, 0});
        for (std::size_t n = 0; n < oAll.GetBufferSize(); ++n)
            oAll.GetBuffer()[n] = static_cast<unsigned char>(n * n / 7 + n / WIDTH);
        oWriter.WriteRaster(&oAll);
        oWriter.Synchronize();
    }

    // Of tiles that consist of whole blocks, or of others.
    ReaderFactory MakeReaders(unsigned int nTile) const
    {
        return [this, nTile]
        {
            auto poReader = OpenHaloReader(moScene, {1}, 2);
            poReader->SetTileSize(nTile, nTile);
            return poReader;
        };
    }

    // The difference to the pixel above and left of each; some tiles take longer than others.
    static std::unique_ptr<Raster> Filter(const std::unique_ptr<Raster>& poTile)
    {
        std::this_thread::sleep_for(std::chrono::microseconds(poTile->GetX() * 7919 % 800));
        auto poResult =
            std::make_unique<Raster>(poTile->GetInfo(), krv::gobs::RasterContext(poTile->GetX(), poTile->GetY()));
        const unsigned int nWidth = poTile->GetWidth();
        for (std::size_t n = 0; n < poResult->GetBufferSize(); ++n)
        {
            const unsigned char* const pPixel = poTile->GetBuffer() + (n / nWidth + 2) * (nWidth + 4) + n % nWidth + 2;
            poResult->GetBuffer()[n] =
                static_cast<unsigned char>(pPixel[0] - pPixel[-1 - static_cast<int>(nWidth + 4)]);
        }
        return poResult;
    }

    std::string moScene = moHome.GetFolder().GetPath() + "/scene.tif";
    krv::threading::ThreadPool moOne{1}, moSeven{7};
    const std::vector<IExecutor*> moExecutors{nullptr, &moOne, &moSeven};
};

} // namespace

// Encoded apart or written whole, the file is that of a writer which got the rasters one after the other.
TEST_F(TileWritingThreads, FilesAreTheSameForAnyNumberOfThreads)
{
    for (const unsigned int nTile : {64u, 50u})
    {
        std::string expected;
        for (int nRun = -1; nRun < 3; ++nRun)
        {
            const std::string file = moHome.GetFolder().GetPath() + "/copy.tif";
            {
                BasicWriter oWriter(file, {1}, "TIF", "TILED=YES BLOCKXSIZE=64 BLOCKYSIZE=32 COMPRESS=DEFLATE");
                oWriter.CreateNewFile({WIDTH, HEIGHT, 1, krv::gobs::eDT_8U});
                const auto poReader = MakeReaders(nTile)();
                for (unsigned int n = 0; nRun < 0 && n < poReader->GetTileCount(); ++n)
                    oWriter.WriteRaster(Filter(std::unique_ptr<Raster>(poReader->GetRaster(n))).get());
                EXPECT_TRUE(nRun < 0 || WriteTiles(MakeReaders(nTile), Filter, oWriter, {moExecutors[nRun], {}, {}}));
                oWriter.Synchronize();
            }
            const std::string bytes = krv::conformance::ReadFile(file);
            expected = nRun < 0 ? bytes : expected;
            EXPECT_TRUE(bytes == expected) << "tiles of " << nTile << ", run " << nRun;
            std::filesystem::remove(file);
        }
    }
}

// Of several failures the first one in the order of the tiles is told; nothing runs any more then.
TEST_F(TileWritingThreads, TheFirstFailureEndsAllAndSoDoesTheCaller)
{
    for (IExecutor* const poExecutor : moExecutors)
    {
        std::atomic<int> nRunning = 0;
        const auto Work = [&](const std::unique_ptr<Raster>& poTile)
        {
            ++nRunning;
            Filter(poTile);
            --nRunning;
            const int nTile = poTile->GetX() / 50 + poTile->GetY() / 50 * 6;
            if (nTile >= 9)
                throw krv::DataException("tile " + std::to_string(nTile));
            return nTile;
        };
        std::vector<int> oTaken;
        const auto Take = [&](int nTile)
        {
            oTaken.push_back(nTile);
        };
        EXPECT_EQ(Error([&] { ForEachTile(MakeReaders(50), Work, Take, {poExecutor, {}, {}}); }), "data: tile 9");
        EXPECT_EQ(oTaken, (std::vector<int>{0, 1, 2, 3, 4, 5, 6, 7, 8}));
        EXPECT_EQ(nRunning, 0);

        oTaken.clear();
        const auto Stop = [&](unsigned int nDone, unsigned int nTotal)
        {
            EXPECT_EQ(nTotal, 24u);
            EXPECT_EQ(nDone, oTaken.size());
            return nDone < 4;
        };
        EXPECT_FALSE(ForEachTile(MakeReaders(50), Work, Take, {poExecutor, {}, Stop}));
        EXPECT_EQ(oTaken, (std::vector<int>{0, 1, 2, 3}));
        EXPECT_EQ(nRunning, 0);
        EXPECT_THROW(ForEachTile([] { return std::unique_ptr<IRasterReader>(); }, Work, Take, {poExecutor, {}, {}}),
                     krv::DataException);
    }
}

} // namespace krv::test
