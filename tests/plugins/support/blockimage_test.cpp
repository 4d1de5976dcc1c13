#include "plugins/support/image/blockimage.h"

#include "tests/plugins/support/countingsource.h"
#include "toolkit/cache/tilestore.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <latch>
#include <random>
#include <thread>

using namespace krv::plugins::support;
using krv::cache::TileStore;
using krv::tests::CountingSource;
using krv::tests::DecodeCounts;

namespace
{

constexpr unsigned int BLOCK = 128;
constexpr std::uint64_t BLOCK_BYTES = BLOCK * BLOCK * 2 + 256;

ImageLayout MakeLayout(unsigned int nWidth, unsigned int nHeight, unsigned int nPlanes = 1)
{
    return {nWidth, nHeight, BLOCK, BLOCK,
            std::vector<Plane>(nPlanes, Plane{krv::gobs::DataType(krv::gobs::eDT_16U), 1, {}})};
}

std::shared_ptr<DecodeCounts> MakeCounts(const ImageLayout& oLayout)
{
    return std::make_shared<DecodeCounts>(std::size_t{oLayout.GetBlocksAcross()} * oLayout.GetBlocksDown() *
                                          oLayout.GetPlaneCount());
}

void Settle(const std::string& fileName)
{
    while (!File(fileName, File::Mode::eRead).GetStamp())
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
}

// An image of its own over a file opened anew.
std::unique_ptr<BlockImage> OpenShared(const std::string& fileName, const ImageLayout& oLayout,
                                       const std::shared_ptr<DecodeCounts>& poCounts,
                                       const std::string& image = "TEST 1", std::uint16_t nShift = 0,
                                       BlockCache::Sharing eSharing = BlockCache::Sharing::eByOrigin)
{
    auto poSource = std::make_shared<CountingSource>(
        oLayout, poCounts, BlockOrigin{std::make_shared<File>(fileName, File::Mode::eRead), image});
    poSource->mnShift = nShift;
    return std::make_unique<BlockImage>(poSource, std::make_shared<BlockCache>(eSharing));
}

std::unique_ptr<BlockImage> OpenAlone(const ImageLayout& oLayout, const std::shared_ptr<DecodeCounts>& poCounts)
{
    return std::make_unique<BlockImage>(std::make_shared<CountingSource>(oLayout, poCounts),
                                        std::make_shared<BlockCache>());
}

// Reads a rectangle of all channels and says whether every value is right.
bool ReadsRight(BlockImage& oImage, const PixelRect& oRect, std::uint16_t nShift = 0)
{
    const unsigned int nChannels = oImage.GetLayout().GetChannelCount();
    std::vector<unsigned int> oChannels;
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
        oChannels.push_back(nChannel);
    const ChannelSelection oSelection(oImage.GetLayout(), oChannels);
    std::vector<std::uint16_t> oPixels(std::size_t{oRect.mnWidth} * oRect.mnHeight * nChannels, 0xABCD);
    oImage.Read(oSelection, oRect, reinterpret_cast<unsigned char*>(oPixels.data()),
                std::size_t{oRect.mnWidth} * nChannels * 2);
    const std::uint16_t* pValue = oPixels.data();
    for (unsigned int nY = 0; nY < oRect.mnHeight; ++nY)
        for (unsigned int nX = 0; nX < oRect.mnWidth; ++nX)
            for (unsigned int nPlane = 0; nPlane < nChannels; ++nPlane)
                if (*pValue++ != static_cast<std::uint16_t>(
                                     CountingSource::ValueAt(nPlane, oRect.mnX + nX, oRect.mnY + nY) + nShift))
                    return false;
    return true;
}

// The windows of a pass over tiles with margins, cut off at the image's border as readers do.
std::vector<PixelRect> MakePass(const ImageLayout& oLayout, unsigned int nTile, unsigned int nMargin)
{
    std::vector<PixelRect> oWindows;
    for (unsigned int nY = 0; nY < oLayout.GetHeight(); nY += nTile)
        for (unsigned int nX = 0; nX < oLayout.GetWidth(); nX += nTile)
        {
            const unsigned int nLeft = nX - std::min(nX, nMargin), nTop = nY - std::min(nY, nMargin);
            oWindows.push_back({nLeft, nTop, std::min(nX + nTile + nMargin, oLayout.GetWidth()) - nLeft,
                                std::min(nY + nTile + nMargin, oLayout.GetHeight()) - nTop});
        }
    return oWindows;
}

class BlockImageTest : public testing::Test
{
protected:
    ~BlockImageTest() override { moStore.SetBudget(mnBudget); }

    // Passes over the image by so many images in turn; the most and the sum of decodes, in decodes per block.
    struct Outcome
    {
        unsigned int mnMost;
        double mnPerBlock;
    };
    Outcome Pass(std::vector<std::unique_ptr<BlockImage>>& oImages, const std::vector<PixelRect>& oWindows,
                 const DecodeCounts& oCounts)
    {
        std::size_t nImage = 0;
        for (const PixelRect& oWindow : oWindows)
            EXPECT_TRUE(ReadsRight(*oImages[nImage++ % oImages.size()], oWindow));
        return {oCounts.GetMost(), oCounts.GetSum() / static_cast<double>(oCounts.moCounts.size())};
    }

    // A file that was last changed long enough ago for datasets to share what is in it.
    static const std::string& GetSettledFile()
    {
        static const krv::conformance::TempFolder oFolder;
        static const std::string fileName = []
        {
            std::string name = oFolder.Write("f", std::string(1000, 'x'));
            Settle(name);
            return name;
        }();
        return fileName;
    }

    TileStore& moStore = TileStore::Process();
    std::uint64_t mnBudget = moStore.GetBudget();
};

} // namespace

TEST_F(BlockImageTest, APassWithMarginsDecodesEachBlockOnceWhileARowOfBlocksFits)
{
    const ImageLayout oLayout = MakeLayout(64 * BLOCK - 5, 5 * BLOCK - 3);
    const std::uint64_t nRow = 64 * BLOCK_BYTES;
    struct Case
    {
        const char* mpName;
        unsigned int mnTile;
        unsigned int mnMargin;
        std::uint64_t mnBudget;
        bool mbShuffled; // the tiles of each row in any order
        unsigned int mnMost;
    };
    const Case CASES[] = {
        {"a row of blocks and the margins", BLOCK, 4, nRow + nRow / 4, false, 1},
        {"tiles of several blocks", 2 * BLOCK, 4, 3 * nRow, false, 1},
        {"tiles of parts of blocks", BLOCK / 2, 4, nRow + nRow / 3, false, 1},
        {"tiles that fit nowhere", BLOCK + 20, 4, 2 * nRow + nRow / 3, false, 1},
        {"all three rows, in any order", BLOCK, 4, 4 * nRow, true, 1},
        {"a third of a row", BLOCK, 4, nRow / 3, false, 2},
        {"three quarters of a row, in any order", BLOCK, 4, nRow * 3 / 4, true, 2},
    };
    for (const Case& oCase : CASES)
    {
        std::vector<PixelRect> oWindows = MakePass(oLayout, oCase.mnTile, oCase.mnMargin);
        std::mt19937 oRandom(1);
        for (auto oRow = oWindows.begin(); oRow != oWindows.end() && oCase.mbShuffled;)
        {
            const auto oEnd =
                std::find_if(oRow, oWindows.end(), [&](const PixelRect& oRect) { return oRect.mnY != oRow->mnY; });
            std::shuffle(oRow, oEnd, oRandom);
            oRow = oEnd;
        }
        for (const std::size_t nPlanes : {std::size_t{1}, std::size_t{2}})
        {
            const ImageLayout oPlanes =
                MakeLayout(oLayout.GetWidth(), oLayout.GetHeight(), static_cast<unsigned int>(nPlanes));
            moStore.SetBudget(oCase.mnBudget * nPlanes);
            moStore.ResetStatistics();
            const auto poCounts = MakeCounts(oPlanes);
            std::vector<std::unique_ptr<BlockImage>> oImages;
            oImages.push_back(OpenAlone(oPlanes, poCounts));
            const Outcome oOutcome = Pass(oImages, oWindows, *poCounts);
            EXPECT_LE(oOutcome.mnMost, oCase.mnMost) << oCase.mpName << ", " << oOutcome.mnPerBlock << " a block";
            EXPECT_LE(moStore.GetStatistics().mnPeak, oCase.mnBudget * nPlanes + 4 * BLOCK_BYTES) << oCase.mpName;
        }
    }
}

TEST_F(BlockImageTest, ReadersOfOneFileDecodeEachBlockOnceTogether)
{
    const std::string& fileName = GetSettledFile();
    const ImageLayout oLayout = MakeLayout(64 * BLOCK, 4 * BLOCK, 2);
    moStore.SetBudget(2 * 64 * BLOCK_BYTES * 3 / 2);
    for (const std::size_t nReaders : {2, 4})
    {
        const auto poCounts = MakeCounts(oLayout);
        std::vector<std::unique_ptr<BlockImage>> oImages;
        for (std::size_t nReader = 0; nReader < nReaders; ++nReader)
            oImages.push_back(OpenShared(fileName, oLayout, poCounts));
        const Outcome oOutcome = Pass(oImages, MakePass(oLayout, BLOCK, 6), *poCounts);
        EXPECT_EQ(oOutcome.mnMost, 1u) << nReaders << " readers: " << oOutcome.mnPerBlock;
    }
    // Threads that take tiles as they come, one far ahead of another at times.
    moStore.SetBudget(mnBudget);
    const auto poCounts = MakeCounts(oLayout);
    const std::vector<PixelRect> oWindows = MakePass(oLayout, BLOCK, 6);
    std::atomic<std::size_t> nNext{0};
    std::atomic<int> nWrong{0};
    std::vector<std::unique_ptr<BlockImage>> oImages;
    for (int nThread = 0; nThread < 4; ++nThread)
        oImages.push_back(OpenShared(fileName, oLayout, poCounts));
    std::vector<std::thread> oThreads;
    for (const auto& poImage : oImages)
        oThreads.emplace_back(
            [&]
            {
                for (std::size_t nAt = nNext++; nAt < oWindows.size(); nAt = nNext++)
                    nWrong += !ReadsRight(*poImage, oWindows[nAt]);
            });
    for (std::thread& oThread : oThreads)
        oThread.join();
    EXPECT_EQ(nWrong, 0);
    EXPECT_EQ(poCounts->GetMost(), 1u);
}

// Whatever is not surely the same stays apart: pixels of the one would be wrong for the other.
TEST_F(BlockImageTest, OnlyTheSameImageOfTheSameUnchangedFileIsShared)
{
    const krv::conformance::TempFolder oFolder;
    const std::string fileName = oFolder.Write("f", "the same");
    const std::string other = oFolder.Write("g", "bytes...");
    const std::string replacing = oFolder.Write("new", "the same");
    std::filesystem::create_hard_link(other, oFolder.File("h"));
    Settle(other);
    const ImageLayout oLayout = MakeLayout(4 * BLOCK, 4 * BLOCK);
    const PixelRect oWindow{10, 10, 100, 100};
    const auto poCounts = MakeCounts(oLayout);
    const auto poFirst = OpenShared(fileName, oLayout, poCounts);
    ASSERT_TRUE(ReadsRight(*poFirst, oWindow));
    const unsigned int nOnce = poCounts->GetSum();
    // Each of these has other pixels than the first.
    std::uint16_t nShift = 1;
    const auto Alone = [&](const std::string& name, const ImageLayout& oItsLayout, const std::string& image,
                           BlockCache::Sharing eSharing)
    {
        const auto poOwn = MakeCounts(oItsLayout);
        const auto poImage = OpenShared(name, oItsLayout, poOwn, image, nShift, eSharing);
        return ReadsRight(*poImage, oWindow, nShift++) && poOwn->GetSum() != 0 && ReadsRight(*poFirst, oWindow);
    };
    constexpr auto BY_ORIGIN = BlockCache::Sharing::eByOrigin;
    EXPECT_TRUE(Alone(other, oLayout, "TEST 1", BY_ORIGIN)) << "another file of the same size";
    EXPECT_TRUE(Alone(fileName, oLayout, "TEST 2", BY_ORIGIN)) << "another image, or option, or format";
    EXPECT_TRUE(Alone(fileName, MakeLayout(4 * BLOCK, 5 * BLOCK), "TEST 1", BY_ORIGIN)) << "another layout";
    EXPECT_TRUE(Alone(fileName, oLayout, "TEST 1", BlockCache::Sharing::eAlone)) << "a dataset that is written";
    EXPECT_EQ(poCounts->GetSum(), nOnce);

    // The same, also by another name of the file: not decoded again.
    ASSERT_TRUE(ReadsRight(*OpenShared(fileName, oLayout, poCounts), oWindow));
    EXPECT_EQ(poCounts->GetSum(), nOnce);
    const auto poLinked = MakeCounts(oLayout);
    const auto poByOne = OpenShared(other, oLayout, poLinked),
               poByOther = OpenShared(oFolder.File("h"), oLayout, poLinked);
    EXPECT_TRUE(ReadsRight(*poByOne, oWindow) && ReadsRight(*poByOther, oWindow));
    EXPECT_EQ(poLinked->GetSum(), nOnce);

    // Written to in this process, which files' times need not show yet.
    {
        File oWriter(fileName, File::Mode::eUpdate);
        EXPECT_TRUE(Alone(fileName, oLayout, "TEST 1", BY_ORIGIN)) << "opened to be written";
        oWriter.Write(0, "y", 1);
        EXPECT_TRUE(Alone(fileName, oLayout, "TEST 1", BY_ORIGIN)) << "written";
    }
    // Whoever opened the file before goes on alone: what it decodes now is for nobody else.
    const auto poSecond = OpenShared(other, oLayout, poLinked);
    std::ofstream(other, std::ios::app) << "more";
    EXPECT_TRUE(ReadsRight(*poByOne, {150, 150, 20, 20}));
    const unsigned int nBefore = poLinked->GetSum();
    EXPECT_TRUE(ReadsRight(*poSecond, {150, 150, 20, 20}));
    EXPECT_GT(poLinked->GetSum(), nBefore);
    // Replaced by a file of the same name and size.
    std::filesystem::rename(replacing, fileName);
    EXPECT_TRUE(Alone(fileName, oLayout, "TEST 1", BY_ORIGIN)) << "another file of that name";
    Settle(fileName);
    EXPECT_TRUE(Alone(fileName, oLayout, "TEST 1", BY_ORIGIN)) << "another file of that name, later";
}

// Random windows, budgets, planes and threads against the model.
TEST_F(BlockImageTest, RandomWindowsOfThreadsUnderAnyBudgetAreRight)
{
    const std::string& fileName = GetSettledFile();
    const ImageLayout oLayout = MakeLayout(10 * BLOCK - 7, 9 * BLOCK + 5, 3);
    const auto poCounts = MakeCounts(oLayout);
    std::atomic<int> nWrong{0};
    const auto Work = [&](unsigned int nThread)
    {
        std::mt19937 oRandom(nThread);
        for (int nRound = 0; nRound < 12; ++nRound)
        {
            const bool bShared = oRandom() % 4 != 0;
            const auto poImage =
                OpenShared(fileName, oLayout, poCounts, bShared ? "TEST 1" : "TEST 2", bShared ? 0 : 9);
            for (int nWindow = 0; nWindow < 25; ++nWindow)
            {
                const auto Below = [&oRandom](unsigned int nEnd)
                {
                    return static_cast<unsigned int>(oRandom() % nEnd);
                };
                const unsigned int nX = Below(oLayout.GetWidth()), nY = Below(oLayout.GetHeight());
                nWrong += !ReadsRight(*poImage,
                                      {nX, nY, 1 + Below(std::min(200u, oLayout.GetWidth() - nX)),
                                       1 + Below(std::min(200u, oLayout.GetHeight() - nY))},
                                      bShared ? 0 : 9);
                if (oRandom() % 50 == 0)
                    poImage->DropBlocks();
                if (oRandom() % 20 == 0)
                    TileStore::Process().SetBudget(1 + oRandom() % (100 * BLOCK_BYTES));
            }
        }
    };
    std::vector<std::thread> oThreads;
    for (unsigned int nThread = 0; nThread < 5; ++nThread)
        oThreads.emplace_back(Work, nThread);
    for (std::thread& oThread : oThreads)
        oThread.join();
    EXPECT_EQ(nWrong, 0);
    EXPECT_EQ(moStore.GetStatistics().mnTiles, 0u);
    EXPECT_EQ(moStore.GetStatistics().mnBytes, 0u);
}

// Images whose blocks are made of each other's, as of linked files, read from both ends at once.
TEST_F(BlockImageTest, ThreadsThatReadImagesMadeOfOthersNeverWaitForEachOther)
{
    const std::string& fileName = GetSettledFile();
    const ImageLayout oLayout = MakeLayout(8 * BLOCK, 2 * BLOCK);
    const auto poCounts = MakeCounts(oLayout);
    std::latch oBoth(2);
    const auto Work = [&](const std::string& own, const std::string& other)
    {
        const auto poInner = OpenShared(fileName, oLayout, poCounts, other);
        auto poSource = std::make_shared<CountingSource>(
            oLayout, poCounts, BlockOrigin{std::make_shared<File>(fileName, File::Mode::eRead), own});
        bool bFirst = true;
        poSource->moBefore = [&](const BlockAddress& oBlock)
        {
            if (std::exchange(bFirst, false))
                oBoth.arrive_and_wait();
            EXPECT_TRUE(ReadsRight(*poInner, {oBlock.mnColumn * BLOCK + 1, oBlock.mnRow * BLOCK + 1, 20, 20}));
        };
        BlockImage oOuter(poSource, std::make_shared<BlockCache>(BlockCache::Sharing::eByOrigin));
        for (const PixelRect& oWindow : MakePass(oLayout, BLOCK, 3))
            EXPECT_TRUE(ReadsRight(oOuter, oWindow));
    };
    std::thread oThread(Work, "TEST A", "TEST B");
    Work("TEST B", "TEST A");
    oThread.join();
}

TEST_F(BlockImageTest, ADamagedBlockFailsInEveryThreadAndIsTriedAnew)
{
    const std::string& fileName = GetSettledFile();
    const ImageLayout oLayout = MakeLayout(2 * BLOCK, BLOCK);
    const auto poCounts = MakeCounts(oLayout);
    std::atomic<int> nFailed{0};
    std::atomic<bool> bDamaged{true};
    const auto Open = [&]
    {
        auto poSource = std::make_shared<CountingSource>(
            oLayout, poCounts, BlockOrigin{std::make_shared<File>(fileName, File::Mode::eRead), "TEST 1"});
        poSource->moBefore = [&](const BlockAddress& oBlock)
        {
            if (bDamaged && oBlock.mnColumn == 1)
                throw krv::FileFormatException("f", "f: damaged");
        };
        return std::make_unique<BlockImage>(poSource, std::make_shared<BlockCache>(BlockCache::Sharing::eByOrigin));
    };
    std::vector<std::thread> oThreads;
    for (int nThread = 0; nThread < 8; ++nThread)
        oThreads.emplace_back(
            [&]
            {
                const auto poImage = Open();
                try
                {
                    ReadsRight(*poImage, {BLOCK - 20, 5, 50, 50});
                }
                catch (const krv::FileFormatException& oFailure)
                {
                    nFailed += oFailure.GetMessage() == "f: damaged";
                }
            });
    for (std::thread& oThread : oThreads)
        oThread.join();
    EXPECT_EQ(nFailed, 8);
    bDamaged = false;
    EXPECT_TRUE(ReadsRight(*Open(), {BLOCK - 20, 5, 50, 50}));
}
