// Threads that share files through the process's store of tiles, for as long as one likes. KRV_SOAK_ROUNDS says how
// many rounds each thread makes, KRV_SOAK_SEED begins them elsewhere.
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "tests/soak/soakrun.h"
#include "toolkit/cache/tilestore.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace
{

using krv::cache::TileStore;
using krv::conformance::TempFolder;
using krv::datasources::BasicReader;
using krv::datasources::BasicWriter;
using krv::gobs::Raster;
using krv::test::MakeRandom;
using krv::test::Random;
using krv::test::Rounds;

constexpr unsigned int WIDTH = 330;
constexpr unsigned int HEIGHT = 290;
constexpr unsigned int CHANNELS = 2;

// What a file holds, in one of its states.
std::uint16_t ValueAt(unsigned int nFile, unsigned int nState, unsigned int nX, unsigned int nY, unsigned int nChannel)
{
    return static_cast<std::uint16_t>(nX * 3 + nY * 5 + nX * nY % 7 + nChannel * 1009 + nFile * 2003 + nState * 7919);
}

template <typename Action>
void ForEachValue(const Raster& oRaster, const Action& oAction)
{
    auto* pValue = reinterpret_cast<std::uint16_t*>(const_cast<unsigned char*>(oRaster.GetBuffer()));
    const int nLeft = oRaster.GetX() - static_cast<int>(oRaster.GetXMargin());
    const int nTop = oRaster.GetY() - static_cast<int>(oRaster.GetYMargin());
    for (unsigned int nRow = 0; nRow < oRaster.GetHeight() + 2 * oRaster.GetYMargin(); ++nRow)
        for (unsigned int nColumn = 0; nColumn < oRaster.GetWidth() + 2 * oRaster.GetXMargin(); ++nColumn)
            for (unsigned int nChannel = 0; nChannel < CHANNELS; ++nChannel)
                oAction(*pValue++, nLeft + static_cast<int>(nColumn), nTop + static_cast<int>(nRow), nChannel);
}

void WriteState(BasicWriter& oWriter, unsigned int nFile, unsigned int nState)
{
    Raster oImage({WIDTH, HEIGHT, CHANNELS, krv::gobs::eDT_16U}, {0, 0, 0, 0});
    ForEachValue(
        oImage, [&](std::uint16_t& nValue, int nX, int nY, unsigned int nChannel)
        { nValue = ValueAt(nFile, nState, static_cast<unsigned int>(nX), static_cast<unsigned int>(nY), nChannel); });
    oWriter.WriteRaster(&oImage);
    oWriter.Synchronize();
}

std::string MakeFile(const TempFolder& oFolder, unsigned int nFile)
{
    static const char* const OPTIONS[] = {"COMPRESS=DEFLATE BLOCKXSIZE=64 BLOCKYSIZE=64",
                                          "COMPRESS=ZSTD BLOCKXSIZE=48 BLOCKYSIZE=80 INTERLEAVE=BAND",
                                          "COMPRESS=LZW PREDICTOR=YES TILED=NO", "BLOCKXSIZE=64 BLOCKYSIZE=64"};
    const bool bTif = nFile % 3 != 1;
    const std::string fileName = oFolder.File(std::to_string(nFile) + (bTif ? ".tif" : ".krv"));
    BasicWriter oWriter(fileName, {1, 2}, bTif ? "TIF" : "KRVDSK", OPTIONS[bTif ? nFile % 4 : 0]);
    oWriter.CreateNewFile(krv::gobs::RasterInfo(WIDTH, HEIGHT, CHANNELS, krv::gobs::eDT_16U));
    WriteState(oWriter, nFile, 0);
    if (nFile % 5 == 0)
    {
        EXPECT_TRUE(krv::datasources::BuildOverviews(oWriter, {2}, "average"));
        oWriter.Synchronize();
    }
    return fileName;
}

// Reads some tiles of the file; the values that are wrong. The first value of all tells which state it is, of a file
// that has several; what is read as long as the reader is there is of that one.
unsigned int CountWrong(const std::string& fileName, unsigned int nFile, bool bStates, Random& oRandom)
{
    BasicReader oReader(fileName, {1, 2});
    const std::unique_ptr<Raster> oFirst(oReader.ReadRaster(0, 0, 1, 1));
    const auto nFirst = *reinterpret_cast<const std::uint16_t*>(oFirst->GetBuffer());
    unsigned int nState = 0;
    while (bStates && nState < 65536 && ValueAt(nFile, nState, 0, 0, 0) != nFirst)
        ++nState;
    const unsigned int nTile = 40 + oRandom() % 90;
    oReader.SetTileSize(nTile, nTile);
    const unsigned int nMargin = oRandom() % 9;
    oReader.SetMargins(nMargin, nMargin, eMirror);
    unsigned int nWrong = 0;
    const unsigned int nBegin = oRandom() % oReader.GetTileCount();
    const unsigned int nEnd = std::min(oReader.GetTileCount(), nBegin + oRandom() % 12);
    for (unsigned int nAt = nBegin; nAt < nEnd; ++nAt)
    {
        const std::unique_ptr<Raster> oTile(oReader.GetRaster(nAt));
        // Margins that reach the border of the image are made, not read.
        const int nRight = oTile->GetX() + static_cast<int>(oTile->GetWidth());
        const int nBottom = oTile->GetY() + static_cast<int>(oTile->GetHeight());
        const int nOver = static_cast<int>(nMargin);
        const bool bInside = oTile->GetX() >= nOver && oTile->GetY() >= nOver &&
                             nRight + nOver < static_cast<int>(WIDTH) && nBottom + nOver < static_cast<int>(HEIGHT);
        ForEachValue(*oTile,
                     [&](std::uint16_t nValue, int nX, int nY, unsigned int nChannel)
                     {
                         if (bInside || (nX >= oTile->GetX() && nY >= oTile->GetY() && nX < nRight && nY < nBottom))
                             nWrong += nValue != ValueAt(nFile, nState, static_cast<unsigned int>(nX),
                                                         static_cast<unsigned int>(nY), nChannel);
                     });
    }
    return nWrong;
}

} // namespace

// Eight threads, twenty files of two formats, a budget that changes, and a writer that gives one file state after
// state: nobody ever sees a value of another file or state.
TEST(Stress, ThreadsShareFilesWhileOneIsUpdated)
{
    constexpr unsigned int FILES = 20;
    const TempFolder oFolder;
    TileStore& oStore = TileStore::Process();
    const std::uint64_t nBudget = oStore.GetBudget();
    std::vector<std::string> oFiles;
    for (unsigned int nFile = 0; nFile < FILES; ++nFile)
        oFiles.push_back(MakeFile(oFolder, nFile));
    // What was changed just now is not shared.
    std::this_thread::sleep_for(std::chrono::milliseconds(2100));
    oStore.ResetStatistics();

    std::atomic<unsigned int> nWrong{0};
    std::atomic<unsigned int> nWorking{8};
    std::vector<std::thread> oThreads;
    for (unsigned int nThread = 1; nThread <= 8; ++nThread)
        oThreads.emplace_back(
            [&, oOwn = MakeRandom(20 + nThread)]() mutable
            {
                for (unsigned int nRound = 0; nRound < 4 * Rounds(); ++nRound)
                {
                    const unsigned int nFile = oOwn() % 4 == 0 ? 0 : oOwn() % FILES;
                    nWrong += CountWrong(oFiles[nFile], nFile, nFile == 0, oOwn) != 0;
                    if (oOwn() % 8 == 0)
                        oStore.SetBudget(1 + oOwn() % (1u << 20));
                }
                --nWorking;
            });
    for (unsigned int nState = 1; nWorking > 0; ++nState)
    {
        BasicWriter oWriter(oFiles[0], {1, 2});
        WriteState(oWriter, 0, nState);
        std::this_thread::sleep_for(std::chrono::milliseconds(nState % 40));
    }
    for (std::thread& oThread : oThreads)
        oThread.join();
    EXPECT_EQ(nWrong, 0u);
    EXPECT_GT(oStore.GetStatistics().mnHits, 0u);
    EXPECT_GT(oStore.GetStatistics().mnEvictions, 0u);
    EXPECT_EQ(oStore.GetStatistics().mnTiles, 0u);
    oStore.SetBudget(nBudget);
}

// A file that is cut off while eight threads read it gives each of them an exception, and the whole of it again when it
// is whole again.
TEST(Stress, ThreadsThatReadAFileWhichIsCutOffAreTold)
{
    const TempFolder oFolder;
    Random oRandom = MakeRandom(7);
    for (unsigned int nRound = 0; nRound < 1 + Rounds() / 12; ++nRound)
    {
        const unsigned int nFile = nRound % 3;
        const std::string fileName = MakeFile(oFolder, nFile);
        const auto nSize = std::filesystem::file_size(fileName);
        const std::string bytes = krv::conformance::ReadFile(fileName);
        std::this_thread::sleep_for(std::chrono::milliseconds(2050));
        std::atomic<unsigned int> nTold{0}, nWrong{0}, nStarted{0};
        std::vector<std::thread> oThreads;
        for (unsigned int nThread = 0; nThread < 8; ++nThread)
            oThreads.emplace_back(
                [&]
                {
                    BasicReader oReader(fileName, {1, 2});
                    oReader.SetTileSize(50, 50);
                    oReader.SetMargins(3, 3, eMirror);
                    ++nStarted;
                    try
                    {
                        for (;;)
                            for (unsigned int nTile = 0; nTile < oReader.GetTileCount(); ++nTile)
                            {
                                const std::unique_ptr<Raster> oTile(oReader.GetRaster(nTile));
                                if (nTile % 7 == 0)
                                    TileStore::Process().Clear();
                            }
                    }
                    catch (const krv::FileException&)
                    {
                        ++nTold;
                    }
                });
        while (nStarted < 8)
            std::this_thread::yield();
        std::this_thread::sleep_for(std::chrono::milliseconds(oRandom() % 20));
        std::filesystem::resize_file(fileName, nSize / 2);
        for (std::thread& oThread : oThreads)
            oThread.join();
        EXPECT_EQ(nTold, 8u);
        krv::conformance::WriteFile(fileName, bytes);
        EXPECT_EQ(CountWrong(fileName, nFile, false, oRandom), 0u);
        std::filesystem::remove(fileName);
    }
}
