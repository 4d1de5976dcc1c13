#include "datasources/reader/derived/rastercache.h"

#include "datasources/reader/derived/transformrasterreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/resampling/gridmap.h"
#include "tests/datasources/reader/readertest.h"

#include <atomic>
#include <mutex>
#include <random>
#include <thread>

namespace krv::test
{

namespace
{

using namespace krv::datasources;

class RasterCacheTest : public ReaderTest
{
protected:
    RasterCacheTest()
    {
        moModel->moTypes = {krv::gobs::eDT_8U, krv::gobs::eDT_16S, krv::gobs::eDT_8U};
        moModel->moBitmaps = {{1, ""}};
        moModel->mnWidth = 61;
        moModel->mnHeight = 47;
    }
};

std::string BitsOf(IRasterReader& oReader, krv::gobs::Raster& oRaster)
{
    const auto poMask = ReaderValidity(oReader).Read(oRaster);
    return poMask == nullptr
               ? "all"
               : std::string(reinterpret_cast<const char*>(poMask->GetBits()), std::size_t{poMask->GetBitsSize()});
}

// Random windows with margins of two readers.
void ExpectSame(IRasterReader& oFound, IRasterReader& oExpected, unsigned int nSeed)
{
    std::mt19937 oRandom(nSeed);
    const auto Number = [&](unsigned int nMost)
    {
        return static_cast<unsigned int>(oRandom() % (nMost + 1));
    };
    const unsigned int nWidth = oExpected.GetWidth(), nHeight = oExpected.GetHeight();
    for (unsigned int n = 0; n < 40; ++n)
    {
        const unsigned int x = Number(nWidth - 1), y = Number(nHeight - 1), w = 1 + Number(nWidth - 1 - x),
                           h = 1 + Number(nHeight - 1 - y);
        const eMarginBehaviour eBehaviour = n % 3 == 0 ? eReplicate : (n % 3 == 1 ? eMirror : eWrap);
        const unsigned int xm = n % 2 != 0 ? Number(nWidth / 2) : 0, ym = n % 2 != 0 ? Number(nHeight / 2) : 0;
        oFound.SetMargins(xm, ym, eBehaviour);
        oExpected.SetMargins(xm, ym, eBehaviour);
        RasterPtr oOne, oOther;
        const std::string error = Error([&] { oOther.reset(oExpected.ReadRaster(x, y, w, h)); });
        ASSERT_EQ(Error([&] { oOne.reset(oFound.ReadRaster(x, y, w, h)); }), error);
        if (!error.empty())
            continue;
        ASSERT_EQ(PixelsOf(*oOne), PixelsOf(*oOther)) << "seed " << nSeed << ", window " << n;
        ASSERT_EQ(BitsOf(oFound, *oOne), BitsOf(oExpected, *oOther)) << "seed " << nSeed << ", window " << n;
    }
}

} // namespace

TEST_F(RasterCacheTest, FrontsShareTilesAndChangesAreForgotten)
{
    BasicReader oSource(moFile, {1, 3});
    RasterCache oCache(&oSource, false, {10, 10});
    RasterCache oFront(oCache);
    oFront.SetTileSize(13, 13);
    oFront.SetMargins(2, 1, eMirror);
    EXPECT_NE(oCache.GetTileWidth(), 13u);
    EXPECT_EQ(oCache.GetXMargin(), 0u);
    const std::string first = ReadPixels(oCache);
    const std::uint64_t nMisses = oCache.GetStatistics().mnMisses;
    EXPECT_EQ(nMisses, 7u * 5);
    oFront.SetMargins(0, 0, eMirror);
    EXPECT_EQ(ReadPixels(oFront), first);
    EXPECT_EQ(oFront.GetStatistics().mnMisses, nMisses);
    oFront.Invalidate(10, 10, 1, 11);
    EXPECT_EQ(ReadPixels(oCache), first);
    EXPECT_EQ(oCache.GetStatistics().mnMisses, nMisses + 2);
    oCache.InvalidateAll();
    EXPECT_EQ(ReadPixels(oFront), first);
    EXPECT_EQ(oCache.GetStatistics().mnMisses, 2 * nMisses + 2);
    // Next to no room: everything is read anew, and right.
    RasterCache oSmall(&oSource, false, {10, 10, 1});
    EXPECT_EQ(ReadPixels(oSmall), first);
    EXPECT_EQ(ReadPixels(oSmall), first);
    EXPECT_GT(oSmall.GetStatistics().mnMisses, nMisses);
}

TEST_F(RasterCacheTest, ThreadsReadEachTileOnce)
{
    for (const bool bFactory : {false, true})
    {
        SyntheticDataset oDataset(moModel);
        MultiTypeReader oPlain(&oDataset, {1, 2, 3}), oSource(&oDataset, {1, 2, 3});
        const std::string expected = ReadPixels(oPlain);
        // A dataset for each source, which outlives it.
        std::vector<std::unique_ptr<SyntheticDataset>> oDatasets;
        std::mutex oMutex; // guards oDatasets
        const RasterCache::Factory oFactory = [&]() -> std::unique_ptr<IRasterReader>
        {
            const std::lock_guard<std::mutex> oLock(oMutex);
            oDatasets.push_back(std::make_unique<SyntheticDataset>(moModel));
            return std::make_unique<MultiTypeReader>(oDatasets.back().get(), Channels{1, 2, 3});
        };
        std::unique_ptr<RasterCache> oCache;
        if (bFactory)
            oCache = std::make_unique<RasterCache>(oFactory, CacheOptions{4, 4});
        else
            oCache = std::make_unique<RasterCache>(&oSource, false, CacheOptions{4, 4});
        std::atomic<unsigned int> nWrong{0};
        std::vector<std::thread> oThreads;
        for (unsigned int n = 0; n < 4; ++n)
            oThreads.emplace_back(
                [&]
                {
                    RasterCache oFront(*oCache);
                    for (unsigned int nTimes = 0; nTimes < 3; ++nTimes)
                        nWrong += ReadPixels(oFront) == expected ? 0 : 1;
                });
        for (std::thread& oThread : oThreads)
            oThread.join();
        EXPECT_EQ(nWrong, 0u);
        EXPECT_EQ(oCache->GetStatistics().mnMisses, 16u * 12);
    }
}

TEST_F(RasterCacheTest, BadSourcesAndFailures)
{
    EXPECT_EQ(Error([] { RasterCache oCache(nullptr, true); }), "data: The source reader is NULL");
    EXPECT_EQ(Error([] { RasterCache oCache(RasterCache::Factory{}); }), "data: The factory is empty");
    EXPECT_EQ(Error([] { RasterCache oCache([] { return std::unique_ptr<IRasterReader>(); }); }),
              "data: The factory made no reader");
    moModel->moLevels = {2};
    const auto OverReader = [&]
    {
        auto oSource = std::make_unique<MultiTypeReader>(moFile, Channels{1, 2});
        RasterCache oCache(oSource.get(), true, {8, 8});
        static_cast<void>(oSource.release());
        oCache.SetMargins(3, 3, eMirror);
        const RasterPtr oTile(oCache.GetRaster(0)), oOther(oCache.ReadRaster(20, 20, 9, 9));
        const std::unique_ptr<IOverviewReaderAccessor> oLevels(oCache.GetOverviewReaderAccessor());
        const std::unique_ptr<IRasterReader> oLevel(oLevels->CreateRasterReader(2));
        const RasterPtr oLevelTile(oLevel->GetRaster(0));
    };
    const auto OverFactory = [&]
    {
        RasterCache oCache([&] { return std::make_unique<BasicReader>(moFile, Channels{3}); }, {8, 8});
        RasterCache oFront(oCache);
        const RasterPtr oTile(oFront.GetRaster(3));
    };
    FailAtEveryCall(OverReader, [] {});
    FailAtEveryCall(OverFactory, [] {});

    // A tile that failed is read anew.
    moProbe.Arm(0);
    auto oSource = std::make_unique<BasicReader>(moFile, Channels{1});
    RasterCache oCache(oSource.get(), false, {8, 8});
    moProbe.Arm(1);
    EXPECT_NE(Error([&] { const RasterPtr oTile(oCache.ReadRaster(0, 0, 8, 8)); }), "");
    moProbe.Arm(0);
    EXPECT_EQ(Error([&] { const RasterPtr oTile(oCache.ReadRaster(0, 0, 8, 8)); }), "");
}

// Any of these on top of each other give what they give step by step.
TEST_F(RasterCacheTest, OverATransformOverMixedTypes)
{
    const auto poMap = std::make_shared<krv::gobs::AffineMap>(krv::ogc::cs::GeocodingInfo(3, 0.8, -0.4, -2, 0.5, 0.7));
    const TransformRequest oRequest{50, 40, krv::gobs::Resampling::eCubic};
    MultiTypeReader oMixed(moFile, {1, 2, 3}, eOwnPlace), oOtherMixed(moFile, {1, 2, 3}, eOwnPlace);
    TransformRasterReader oTransform(&oMixed, poMap, oRequest, false), oPlain(&oOtherMixed, poMap, oRequest, false);
    RasterCache oCache(&oTransform, false, {11, 7});
    ExpectSame(oCache, oPlain, 5);
    // The transform of a cache is that of its source.
    RasterCache oBelow(&oMixed, false, {9, 9});
    TransformRasterReader oAbove(&oBelow, poMap, oRequest, false);
    ExpectSame(oAbove, oPlain, 6);
}

} // namespace krv::test
