// What shows itself only after a while: many rounds of ordinary work. A run of all tests makes a few of them;
// KRV_SOAK_ROUNDS says how many, KRV_SOAK_SEED begins them elsewhere.
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/rasterrange.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "tests/soak/soakrun.h"
#include "toolkit/core/hmalloc.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <malloc.h>
#include <optional>
#include <random>
#include <thread>
#include <unistd.h>
#include <zlib.h>

namespace
{

using krv::conformance::TempFolder;
using krv::datasources::BasicReader;
using krv::datasources::BasicWriter;
using krv::gobs::Raster;
using krv::test::MakeRandom;
using krv::test::Random;
using krv::test::Rounds;

// Values that compress to about half, whatever is written over what.
void FillNoise(Raster& oRaster, Random& oRandom)
{
    for (std::uint64_t n = 0; n < oRaster.GetBufferSize(); ++n)
        oRaster.GetBuffer()[n] = static_cast<unsigned char>(oRandom() % 16);
}

void MakeFile(const std::string& fileName, const std::string& options, unsigned int nSide, unsigned int nChannels,
              const krv::gobs::DataType& oType, Random& oRandom)
{
    std::vector<unsigned int> oChannels;
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
        oChannels.push_back(nChannel);
    BasicWriter oWriter(fileName, oChannels, "TIF", options);
    oWriter.CreateNewFile(krv::gobs::RasterInfo(nSide, nSide, nChannels, oType));
    Raster oImage({nSide, nSide, nChannels, oType}, {0, 0, 0, 0});
    FillNoise(oImage, oRandom);
    oWriter.WriteRaster(&oImage);
    oWriter.Synchronize();
}

// One way of reading a file, and what it gives.
struct Reading
{
    std::string moFile;
    unsigned int mnTile;
    unsigned int mnMargin;
    bool mbExact;
    uLong mnChecksum = 0;

    uLong Read() const
    {
        auto oReader = std::make_unique<BasicReader>(moFile);
        return mbExact ? Walk(*std::make_unique<krv::datasources::ExactHaloReader>(oReader.release(), true))
                       : Walk(*oReader);
    }

private:
    uLong Walk(krv::datasources::IRasterReader& oReader) const
    {
        oReader.SetTileSize(mnTile, mnTile);
        oReader.SetMargins(mnMargin, mnMargin, eMirror);
        uLong nSum = ::crc32(0, nullptr, 0);
        for (const std::unique_ptr<Raster> oTile : krv::datasources::RasterRange(oReader))
            nSum = ::crc32_z(nSum, oTile->GetBuffer(), oTile->GetBufferSize());
        return nSum;
    }
};

// Threads with readers of their own read what one thread alone reads, while others open files and ask for capabilities.
TEST(Stress, ManyThreadsReadWhatOneReads)
{
    const TempFolder oFolder;
    Random oRandom = MakeRandom(0);
    std::vector<Reading> oReadings;
    for (const char* pOptions : {"", "COMPRESS=DEFLATE PREDICTOR=YES", "COMPRESS=ZSTD TILED=NO",
                                 "COMPRESS=LZW INTERLEAVE=BAND", "COMPRESS=JPEG"})
    {
        const std::string fileName = oFolder.File("f" + std::to_string(oReadings.size()) + ".tif");
        MakeFile(fileName, pOptions, 700, 3, krv::gobs::eDT_8U, oRandom);
        for (const bool bExact : {false, true})
            for (const unsigned int nMargin : {0u, 5u})
                oReadings.push_back({fileName, 100 + oRandom() % 300, nMargin, bExact});
    }
    for (Reading& oReading : oReadings)
        oReading.mnChecksum = oReading.Read();

    std::atomic<unsigned int> nWrong{0};
    std::atomic<unsigned int> nWorking{4};
    std::vector<std::thread> oThreads;
    for (unsigned int nThread = 1; nThread <= 4; ++nThread)
        oThreads.emplace_back(
            [&, oOwn = MakeRandom(nThread)]() mutable
            {
                for (unsigned int nRound = 0; nRound < Rounds(); ++nRound)
                {
                    const Reading& oReading = oReadings[oOwn() % oReadings.size()];
                    nWrong += oReading.Read() != oReading.mnChecksum;
                }
                --nWorking;
            });
    krv::datasources::DatasetManager* const pManager = krv::datasources::DatasetManager::GetInstance();
    while (nWorking > 0)
    {
        nWrong += !pManager->CanOpen(oReadings[0].moFile, eReadOnly);
        nWrong += !pManager->GetCapabilities("TIF").IsSupported(krv::datasources::CAPABILITY_CREATE);
        std::this_thread::yield();
    }
    for (std::thread& oThread : oThreads)
        oThread.join();
    EXPECT_EQ(nWrong, 0u);
}

// What a program holds and what its file takes.
struct Holding
{
    std::int64_t mnFiles;
    std::int64_t mnMemory;
    std::int64_t mnFileBytes;

    explicit Holding(const std::string& fileName)
        : mnFiles(std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {})),
          mnFileBytes(static_cast<std::int64_t>(std::filesystem::file_size(fileName)))
    {
        HTrim();
        ::malloc_trim(0);
        std::int64_t nAll = 0;
        std::ifstream("/proc/self/statm") >> nAll >> mnMemory;
        mnMemory *= ::sysconf(_SC_PAGESIZE);
    }
};

// One file that is updated, given levels and read again for as long as one likes takes no more room, memory or open
// files than after the first rounds, and always holds what was written last.
TEST(Soak, AnUpdatedFileAndItsProgramStayAsTheyAre)
{
    constexpr unsigned int SIDE = 900;
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("soak.tif");
    Random oRandom = MakeRandom(9);
    MakeFile(fileName, "COMPRESS=ZSTD BLOCKXSIZE=128 BLOCKYSIZE=128", SIDE, 1, krv::gobs::eDT_8U, oRandom);
    std::unique_ptr<Raster> oImage(BasicReader(fileName).ReadRaster(0, 0, SIDE, SIDE));
    std::optional<Holding> oFirst;
    const unsigned int nSettled = Rounds() / 3;
    for (unsigned int nRound = 0; nRound < Rounds(); ++nRound)
    {
        {
            BasicWriter oWriter(fileName, {1});
            for (int nWindow = 0; nWindow < 5; ++nWindow)
            {
                const unsigned int nX = oRandom() % SIDE, nY = oRandom() % SIDE;
                const unsigned int nWidth = 1 + oRandom() % (SIDE - nX);
                const unsigned int nHeight = 1 + oRandom() % std::min(SIDE - nY, 200u);
                Raster oWindow({nWidth, nHeight, 1, krv::gobs::eDT_8U},
                               {static_cast<int>(nX), static_cast<int>(nY), 0, 0});
                FillNoise(oWindow, oRandom);
                oWriter.WriteRaster(&oWindow);
                for (unsigned int nRow = 0; nRow < nHeight; ++nRow)
                    std::copy_n(oWindow.GetBuffer() + nRow * nWidth, nWidth,
                                oImage->GetBuffer() + (nY + nRow) * SIDE + nX);
            }
            if (nRound % 4 == 0)
            {
                ASSERT_TRUE(krv::datasources::BuildOverviews(oWriter, {2, 4}, "average"));
            }
            krv::datasources::AuxiliaryData oTags = oWriter.GetAuxiliaryData();
            oTags.SetFileMetadataValue("ROUND", std::string(oRandom() % 300, 'x'));
            oWriter.SetAuxiliaryData(oTags);
            oWriter.Synchronize();
        }
        const std::unique_ptr<Raster> oRead(BasicReader(fileName).ReadRaster(0, 0, SIDE, SIDE));
        ASSERT_TRUE(std::equal(oRead->GetBuffer(), oRead->GetBuffer() + oRead->GetBufferSize(), oImage->GetBuffer()))
            << "round " << nRound;
        if (nRound == nSettled)
            oFirst.emplace(fileName);
    }
    const Holding oLast(fileName);
    EXPECT_EQ(oLast.mnFiles, oFirst->mnFiles);
    EXPECT_LT(oLast.mnFileBytes, oFirst->mnFileBytes * 3 / 2);
#ifndef KRV_SANITIZED
    EXPECT_LT(oLast.mnMemory, oFirst->mnMemory + (16 << 20));
#endif
}

} // namespace
