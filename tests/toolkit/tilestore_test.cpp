#include "toolkit/cache/tilestore.h"

#include "toolkit/cache/filestamp.h"
#include "toolkit/core/hmalloc.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <latch>
#include <random>
#include <stdexcept>
#include <thread>
#include <unistd.h>
#include <vector>

using namespace krv::cache;

namespace
{

constexpr std::size_t ROW = 64;
constexpr std::size_t ROWS = 64;
constexpr TileShape SHAPE{ROW, ROWS};
constexpr TileArea WHOLE{0, 0, ROW, ROWS};
// What a tile of SHAPE counts for, about.
constexpr std::uint64_t COST = ROW * ROWS + 256;

TileRequest Request(std::uint64_t nTile, const TileArea& oArea = WHOLE, const TileFrame& oFrame = {})
{
    return {{nTile, 0}, SHAPE, oArea, oFrame};
}

// A byte of a tile depends on the tile and on its place.
unsigned char Expected(std::uint64_t nTile, std::size_t nX, std::size_t nY)
{
    return static_cast<unsigned char>(nTile * 7 + nY * 13 + nX);
}

void Fill(std::uint64_t nTile, unsigned char* pBytes)
{
    for (std::size_t nY = 0; nY < ROWS; ++nY)
        for (std::size_t nX = 0; nX < ROW; ++nX)
            *pBytes++ = Expected(nTile, nX, nY);
}

// The tile, and how often it was made.
struct Maker
{
    std::atomic<int> mnMade{0};

    TileHold operator()(const TileOwner& oOwner, const TileRequest& oRequest)
    {
        return oOwner.Obtain(oRequest,
                             [&](unsigned char* pBytes)
                             {
                                 ++mnMade;
                                 Fill(oRequest.moName.mnTile, pBytes);
                             });
    }
};

bool Shows(const TileHold& oHold, std::uint64_t nTile, const TileArea& oArea = WHOLE)
{
    for (std::size_t nY = 0; nY < oArea.mnRows; ++nY)
        for (std::size_t nX = 0; nX < oArea.mnRowBytes; ++nX)
            if (oHold.GetFirst()[nY * oHold.GetPitch() + nX] != Expected(nTile, oArea.mnX + nX, oArea.mnY + nY))
                return false;
    return static_cast<bool>(oHold);
}

void JoinAll(std::vector<std::thread>& oThreads)
{
    for (std::thread& oThread : oThreads)
        oThread.join();
}

} // namespace

TEST(TileStoreTest, OwnersOfOneIdentityShareTilesUntilTheLastGoes)
{
    TileStore oStore(100 * COST);
    Maker oMake;
    {
        const TileOwner oFirst("a", oStore), oOther("b", oStore), oAlone(oStore);
        EXPECT_TRUE(oFirst.IsEmpty());
        EXPECT_TRUE(Shows(oMake(oFirst, Request(1)), 1));
        {
            const TileOwner oSecond("a", oStore);
            EXPECT_TRUE(Shows(oMake(oSecond, Request(1)), 1));
            EXPECT_EQ(oMake.mnMade, 1);
            EXPECT_TRUE(Shows(oSecond.Find(Request(1, {5, 6, 7, 8})), 1, {5, 6, 7, 8}));
            oMake(oSecond, Request(2));
        }
        EXPECT_TRUE(oFirst.Find(Request(2))) << "made by an owner that is gone";
        for (const TileOwner* const poOwner : {&oOther, &oAlone})
        {
            EXPECT_FALSE(poOwner->Find(Request(1)));
            oMake(*poOwner, Request(1));
        }
        EXPECT_EQ(oMake.mnMade, 4);
        // The same name with another shape is another tile; bytes of the old one are never given for it.
        EXPECT_FALSE(oFirst.Find({{1, 0}, {ROW, ROWS + 1}, WHOLE, {}}));
        EXPECT_FALSE(oFirst.Find({{1, 1}, SHAPE, WHOLE, {}}));
        oFirst.Drop({1, 0});
        EXPECT_FALSE(oFirst.Find(Request(1)));
        EXPECT_TRUE(oOther.Find(Request(1)));
        const TileStatistics oNow = oStore.GetStatistics();
        EXPECT_EQ(oNow.mnMisses, 4u);
        EXPECT_EQ(oNow.mnHits, 4u);
        EXPECT_EQ(oNow.mnTiles, 3u);
        EXPECT_EQ(oNow.mnBytes, 3 * COST);
        EXPECT_EQ(oNow.mnPeak, 4 * COST);
    }
    EXPECT_EQ(oStore.GetStatistics().mnTiles, 0u);
    EXPECT_EQ(oStore.GetStatistics().mnBytes, 0u);
    EXPECT_FALSE(TileOwner("a", oStore).Find(Request(2)));
}

TEST(TileStoreTest, WhatWasUsedLeastRecentlyGoesAndWhatIsHeldStays)
{
    TileStore oStore(4 * COST);
    const TileOwner oOwner(oStore);
    Maker oMake;
    for (std::uint64_t nTile = 0; nTile < 4; ++nTile)
        oMake(oOwner, Request(nTile));
    const TileHold oHeld = oOwner.Find(Request(1));
    oMake(oOwner, Request(4)); // 0 goes, 1 was just used
    EXPECT_TRUE(oOwner.Find(Request(2)));
    oMake(oOwner, Request(5)); // 3 goes
    oMake(oOwner, Request(6)); // 1 is held, 4 goes
    EXPECT_TRUE(Shows(oHeld, 1));
    for (const auto& [nTile, bThere] : {std::pair{0, false}, {1, true}, {2, true}, {3, false}, {4, false}, {5, true}})
        EXPECT_EQ(static_cast<bool>(oOwner.Find(Request(nTile))), bThere) << nTile;
    EXPECT_EQ(oStore.GetStatistics().mnEvictions, 3u);
    EXPECT_EQ(oStore.GetStatistics().mnPeak, 4 * COST);

    // The one that is done with goes before older ones.
    oOwner.Retire({6, 0});
    oMake(oOwner, Request(7));
    EXPECT_FALSE(oOwner.Find(Request(6)));
    EXPECT_TRUE(oOwner.Find(Request(2)));

    // Less budget than is held: all else goes, and that when it is let go.
    oStore.SetBudget(1);
    EXPECT_EQ(oStore.GetStatistics().mnTiles, 1u);
    EXPECT_TRUE(Shows(oHeld, 1));
    {
        const TileHold oThrough = oMake(oOwner, Request(9));
        EXPECT_TRUE(Shows(oThrough, 9));
        EXPECT_TRUE(Shows(oMake(oOwner, Request(9)), 9)) << "as long as it is in use";
    }
    EXPECT_FALSE(oOwner.Find(Request(9)));
    EXPECT_TRUE(oOwner.Find(Request(1))) << "a tile above the budget drives none out that is held";
}

TEST(TileStoreTest, BytesKeptElsewhereAndFreedRastersCountIntoTheBudget)
{
    TileStore oStore(4 * COST);
    const TileOwner oOwner(oStore);
    Maker oMake;
    for (std::uint64_t nTile = 0; nTile < 4; ++nTile)
        oMake(oOwner, Request(nTile));
    {
        TileCharge oCharge(oStore);
        oCharge.Set(2 * COST);
        EXPECT_EQ(oStore.GetStatistics().mnTiles, 2u);
        EXPECT_EQ(oStore.GetStatistics().mnBytes, 4 * COST);
        oCharge.Set(COST);
        EXPECT_EQ(oStore.GetStatistics().mnBytes, 3 * COST);
    }
    EXPECT_EQ(oStore.GetStatistics().mnBytes, 2 * COST);

#ifndef KRV_SANITIZED
    // The process's own store and HMalloc.
    constexpr std::size_t MIB = 1 << 20;
    TileStore& oProcess = TileStore::Process();
    const std::uint64_t nBudget = oProcess.GetBudget();
    EXPECT_EQ(nBudget, TileStore::GetDefaultBudget());
    oProcess.SetBudget(16 * MIB);
    const TileOwner oLarge;
    const auto MakeLarge = [&oLarge](std::uint64_t nTile)
    {
        oLarge.Obtain({{nTile, 0}, {MIB, 1}, {0, 0, 1, 1}, {}}, [](unsigned char*) {});
    };
    for (std::uint64_t nTile = 0; nTile < 40; ++nTile)
    {
        MakeLarge(nTile);
        std::vector<void*> oRasters;
        for (int nRaster = 0; nRaster < 4; ++nRaster)
            oRasters.push_back(HMalloc(MIB));
        for (void* const pRaster : oRasters)
            HFree(pRaster);
        ASSERT_LE(oProcess.GetStatistics().mnBytes + HKeptBytes(), 16 * MIB) << nTile;
    }
    EXPECT_GE(HKeptBytes(), MIB) << "tiles make room for the rasters of a loop";
    EXPECT_GT(oProcess.GetStatistics().mnBytes, 12 * MIB);
    oProcess.SetBudget(nBudget);
#endif
}

// Frames of tiles that made room serve what lies in them, and only that.
TEST(TileStoreTest, TheFrameOfATileThatMadeRoomIsServed)
{
    TileStore oStore(3 * COST);
    const TileOwner oOwner(oStore);
    Maker oMake;
    constexpr TileFrame FRAME{5, 3, 4, 6};
    oMake(oOwner, Request(1, WHOLE, {5, 3, 0, 0}));
    oMake(oOwner, Request(1, WHOLE, {1, 2, 4, 6}));
    for (std::uint64_t nTile = 2; nTile < 5; ++nTile)
        oMake(oOwner, Request(nTile));
    std::mt19937 oRandom(5);
    int nServed = 0;
    for (int nTry = 0; nTry < 3000; ++nTry)
    {
        TileArea oArea;
        oArea.mnX = oRandom() % ROW;
        oArea.mnY = oRandom() % ROWS;
        oArea.mnRowBytes = 1 + oRandom() % (nTry % 2 == 0 ? 4 : ROW - oArea.mnX);
        oArea.mnRows = 1 + oRandom() % (nTry % 3 == 0 ? 4 : ROWS - oArea.mnY);
        oArea.mnRowBytes = std::min(oArea.mnRowBytes, ROW - oArea.mnX);
        oArea.mnRows = std::min(oArea.mnRows, ROWS - oArea.mnY);
        const bool bInside = oArea.mnY + oArea.mnRows <= FRAME.mnTop || oArea.mnY >= ROWS - FRAME.mnBottom ||
                             oArea.mnX + oArea.mnRowBytes <= FRAME.mnLeft || oArea.mnX >= ROW - FRAME.mnRight;
        const TileHold oHold = oOwner.Find(Request(1, oArea));
        ASSERT_EQ(static_cast<bool>(oHold), bInside) << nTry;
        ASSERT_TRUE(!bInside || Shows(oHold, 1, oArea)) << nTry;
        nServed += bInside;
    }
    EXPECT_GT(nServed, 100);
    // More than the frame makes the tile anew; with one of more than half nothing stays.
    EXPECT_TRUE(Shows(oMake(oOwner, Request(1)), 1));
    EXPECT_EQ(oMake.mnMade, 5);
    oMake(oOwner, Request(1, WHOLE, {0, 20, 0, 20}));
    oOwner.Retire({1, 0}, {0, 20, 0, 20});
    oMake(oOwner, Request(5));
    oMake(oOwner, Request(6));
    EXPECT_FALSE(oOwner.Find(Request(1, {0, 0, 1, 1})));
    // Of a tile that is done with the frame stays that was said last.
    oMake(oOwner, Request(7, WHOLE, FRAME));
    oOwner.Retire({7, 0}, {0, 0, 0, 6});
    oMake(oOwner, Request(8));
    oMake(oOwner, Request(9));
    EXPECT_FALSE(oOwner.Find(Request(7, {0, 0, 1, 1})));
    EXPECT_TRUE(Shows(oOwner.Find(Request(7, {0, ROWS - 6, ROW, 6})), 7, {0, ROWS - 6, ROW, 6}));
}

// Frames outlive whole tiles, but do not fill the store.
TEST(TileStoreTest, FramesTakeAtMostHalfOfTheRoomForLong)
{
    TileStore oStore(40 * COST);
    const TileOwner oOwner(oStore);
    Maker oMake;
    for (std::uint64_t nTile = 0; nTile < 1000; ++nTile)
        oMake(oOwner, Request(nTile, WHOLE, {0, 0, 0, 16}));
    std::uint64_t nFrames = 0, nWhole = 0;
    for (std::uint64_t nTile = 0; nTile < 1000; ++nTile)
        if (oOwner.Find(Request(nTile)))
            ++nWhole;
        else if (oOwner.Find(Request(nTile, {0, ROWS - 1, ROW, 1})))
            ++nFrames;
    EXPECT_GT(nWhole, 10u);
    EXPECT_GT(nFrames, 40u);
    EXPECT_LE(oStore.GetStatistics().mnPeak, 41 * COST);
}

TEST(TileStoreTest, AClaimThatFailsOrIsWithheldLeavesNothing)
{
    TileStore oStore(4 * COST);
    const TileOwner oOwner(oStore);
    EXPECT_THROW(oOwner.Obtain(Request(1), [](unsigned char*) { throw krv::IOException("f", "f: no"); }),
                 krv::IOException);
    EXPECT_TRUE(oOwner.IsEmpty());
    EXPECT_THROW(oOwner.Obtain({{1, 0}, {std::size_t{1} << 46, 2}, {}, {}}, [](unsigned char*) {}), std::bad_alloc);
    {
        TileLook oLook = oOwner.Look(Request(1));
        ASSERT_TRUE(oLook.moClaim);
        EXPECT_FALSE(oOwner.Look(Request(1), TileOwner::Wait::eNo).moClaim) << "it is being made";
        Fill(1, oLook.moClaim.GetBytes());
        EXPECT_TRUE(Shows(oLook.moClaim.Withhold(WHOLE), 1));
    }
    EXPECT_TRUE(oOwner.IsEmpty());
    {
        TileLook oUndone = oOwner.Look(Request(1));
        // Forgotten while it is made: it goes to nobody who asks later.
        oOwner.DropAll();
        EXPECT_TRUE(oOwner.IsEmpty());
        Fill(1, oUndone.moClaim.GetBytes());
        oUndone.moClaim.Publish(WHOLE);
    }
    EXPECT_FALSE(oOwner.Find(Request(1)));
    EXPECT_EQ(oStore.GetStatistics().mnBytes, 0u);
}

// A thread that makes a tile may look for it again, and for tiles that make each other.
TEST(TileStoreTest, NobodyWaitsWhileThreadsMakeTilesOfEachOther)
{
    TileStore oStore(100 * COST);
    const TileOwner oOwner(oStore);
    const TileHold oSelf = oOwner.Obtain(Request(1),
                                         [&](unsigned char* pBytes)
                                         {
                                             Maker oMake;
                                             EXPECT_TRUE(Shows(oMake(oOwner, Request(1)), 1));
                                             EXPECT_FALSE(oOwner.Find(Request(1)));
                                             Fill(1, pBytes);
                                         });
    EXPECT_TRUE(Shows(oSelf, 1));

    std::latch oBoth(2);
    const auto Cross = [&](std::uint64_t nOwn, std::uint64_t nOther)
    {
        Maker oMake;
        oOwner.Obtain(Request(nOwn),
                      [&](unsigned char* pBytes)
                      {
                          oBoth.arrive_and_wait();
                          EXPECT_TRUE(Shows(oMake(oOwner, Request(nOther)), nOther));
                          Fill(nOwn, pBytes);
                      });
    };
    std::thread oThread(Cross, 2, 3);
    Cross(3, 2);
    oThread.join();
    EXPECT_TRUE(Shows(oOwner.Find(Request(2)), 2));
    EXPECT_TRUE(Shows(oOwner.Find(Request(3)), 3));
}

// Tiles made of what readers give wait for the blocks below them: nobody decodes one twice.
TEST(TileStoreTest, WhoMakesADerivedTileWaitsForTheBlocksOfIt)
{
    TileStore oStore(100 * COST);
    const TileOwner oBlocks(oStore), oDerived(oStore, TileLayer::eDerived);
    Maker oMakeBlock;
    std::thread oThread;
    oBlocks.Obtain(Request(1),
                   [&](unsigned char* pBytes)
                   {
                       oThread = std::thread(
                           [&]
                           {
                               oDerived.Obtain(Request(9),
                                               [&](unsigned char* pDerived)
                                               {
                                                   EXPECT_TRUE(Shows(oMakeBlock(oBlocks, Request(1)), 1));
                                                   Fill(9, pDerived);
                                               });
                           });
                       while (oStore.GetStatistics().mnWaits == 0)
                           std::this_thread::yield();
                       Fill(1, pBytes);
                   });
    oThread.join();
    EXPECT_EQ(oMakeBlock.mnMade, 0);
}

TEST(TileStoreTest, ThreadsThatWaitGetTheTileOrItsException)
{
    TileStore oStore(100 * COST);
    const TileOwner oOwner(oStore);
    for (const bool bFails : {false, true})
    {
        oStore.ResetStatistics();
        std::atomic<int> nMade{0}, nGood{0}, nTold{0};
        const auto Work = [&]
        {
            try
            {
                const TileHold oHold = oOwner.Obtain(Request(4),
                                                     [&](unsigned char* pBytes)
                                                     {
                                                         ++nMade;
                                                         while (oStore.GetStatistics().mnWaits != 7)
                                                             std::this_thread::yield();
                                                         if (bFails)
                                                             throw krv::IOException("f", "f: cut");
                                                         Fill(4, pBytes);
                                                     });
                nGood += Shows(oHold, 4);
            }
            catch (const krv::IOException& oFailure)
            {
                nTold += oFailure.GetMessage() == "f: cut";
            }
        };
        std::vector<std::thread> oThreads;
        for (int nThread = 0; nThread < 8; ++nThread)
            oThreads.emplace_back(Work);
        JoinAll(oThreads);
        EXPECT_EQ(nMade, 1);
        EXPECT_EQ(nGood, bFails ? 0 : 8);
        EXPECT_EQ(nTold, bFails ? 8 : 0);
        oOwner.DropAll();
    }
    EXPECT_EQ(oStore.GetStatistics().mnBytes, 0u);
}

// Random work of all kinds; every byte that is served is right, and what was counted is given back.
TEST(TileStoreTest, ThreadsUnderPressureNeverSeeAnothersBytes)
{
    TileStore oStore(30 * COST);
    std::atomic<int> nWrong{0};
    const auto Work = [&](unsigned int nThread)
    {
        std::mt19937 oRandom(nThread);
        Maker oMake;
        for (int nRound = 0; nRound < 60; ++nRound)
        {
            const TileOwner oShared("x", oStore), oOwn(oStore);
            for (int nStep = 0; nStep < 60; ++nStep)
            {
                const TileOwner& oOwner = nStep % 5 == 0 ? oOwn : oShared;
                const std::uint64_t nTile = oRandom() % 60;
                const TileArea oArea{oRandom() % 8, oRandom() % 8, 1 + oRandom() % 8, 1 + oRandom() % 40};
                const TileRequest oRequest = Request(nTile, oArea, {16, 0, 0, oRandom() % 8});
                try
                {
                    switch (oRandom() % 16)
                    {
                    case 0:
                        oOwner.Drop({nTile, 0});
                        break;
                    case 1:
                        oOwner.Retire({nTile, 0}, {0, 0, 0, oRandom() % 8});
                        break;
                    case 2:
                        if (nStep == 30)
                            oOwner.DropAll();
                        oStore.SetBudget((10 + oRandom() % 30) * COST);
                        break;
                    case 3:
                        if (const TileHold oHold = oOwner.Find(oRequest))
                            nWrong += !Shows(oHold, nTile, oArea);
                        break;
                    case 4:
                        nWrong +=
                            !Shows(oOwner.Obtain(oRequest, [](unsigned char*) { throw std::runtime_error("no"); }),
                                   nTile, oArea);
                        break;
                    default:
                        nWrong += !Shows(oMake(oOwner, oRequest), nTile, oArea);
                    }
                }
                catch (const std::runtime_error&)
                {
                    // Also where another thread's attempt was waited for.
                }
            }
        }
    };
    std::vector<std::thread> oThreads;
    for (unsigned int nThread = 0; nThread < 6; ++nThread)
        oThreads.emplace_back(Work, nThread);
    JoinAll(oThreads);
    EXPECT_EQ(nWrong, 0);
    EXPECT_EQ(oStore.GetStatistics().mnTiles, 0u);
    EXPECT_EQ(oStore.GetStatistics().mnBytes, 0u);
}

TEST(FileStampTest, EveryChangeShowsAndARecentOneIsNotSettled)
{
    const krv::conformance::TempFolder oFolder;
    const std::string fileName = oFolder.File("f");
    std::ofstream(fileName) << "one";
    const int nFile = ::open(fileName.c_str(), O_RDWR);
    const FileStamp oFirst = *FileStamp::Read(nFile);
    EXPECT_EQ(*FileStamp::Read(nFile), oFirst);
    EXPECT_FALSE(oFirst.IsSettled());
    FileStamp oOld = oFirst;
    oOld.mnChanged = oOld.mnModified -= 3000000000;
    EXPECT_TRUE(oOld.IsSettled());
    oOld.mnChanged = oFirst.mnChanged;
    EXPECT_FALSE(oOld.IsSettled()) << "whoever sets the time of the content back changes the status";
    EXPECT_NE(oOld.GetText(), oFirst.GetText());

    FileStamp::NoteChange(oFirst.mnDevice, oFirst.mnInode);
    const FileStamp oNoted = *FileStamp::Read(nFile);
    EXPECT_NE(oNoted, oFirst);
    ASSERT_EQ(::ftruncate(nFile, 2), 0);
    EXPECT_NE(*FileStamp::Read(nFile), oNoted);
    ::close(nFile);
    EXPECT_FALSE(FileStamp::Read(nFile));
}
