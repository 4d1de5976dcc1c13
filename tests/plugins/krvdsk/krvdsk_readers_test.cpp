// Readers beside a writer, each in a process of its own, and what a writer meets: no room, no right, no file, another
// writer.
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "tests/plugins/krvdsk/changes.h"
#include "tests/plugins/krvdsk/disk.h"
#include "tests/soak/soakrun.h"
#include "tests/support/thrown.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <functional>
#include <iostream>
#include <thread>

#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

using namespace krv::test;
using krv::conformance::TempFolder;
using namespace krv::gobs;
using krv::datasources::AuxiliaryData;
using krv::datasources::IRasterIO;

constexpr unsigned int WIDTH = 200;
constexpr unsigned int HEIGHT = 150;
constexpr unsigned int READERS = 8;
constexpr const char* KINDS[] = {"BLOCKXSIZE=64 BLOCKYSIZE=32", "BLOCKXSIZE=64 BLOCKYSIZE=64 COMPRESS=ZSTD",
                                 "BLOCKXSIZE=50 BLOCKYSIZE=40 COMPRESS=LZ4 INTERLEAVE=BAND"};

// A picture of which every byte depends on the state, and on where it stands.
unsigned char ByteAt(unsigned int nState, unsigned int nImage, std::size_t nAt, bool bBits)
{
    const std::size_t nValue = nState * 2654435761U / 7 + nImage * 131 + nAt * 3 + nAt / 61;
    return static_cast<unsigned char>(bBits ? nValue / 5 % 2 : nValue);
}

// A tile at a time, which is stored, or read, at once.
void ForEachTile(IRasterIO& oIO, std::size_t nPixelBytes,
                 const std::function<void(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                          std::vector<unsigned char>& oTile)>& oAction)
{
    std::vector<unsigned char> oTile;
    for (unsigned int nY = 0; nY < oIO.GetFileHeight(); nY += oIO.GetTileHeight())
        for (unsigned int nX = 0; nX < oIO.GetFileWidth(); nX += oIO.GetTileWidth())
        {
            const unsigned int nWidth = std::min(oIO.GetTileWidth(), oIO.GetFileWidth() - nX);
            const unsigned int nHeight = std::min(oIO.GetTileHeight(), oIO.GetFileHeight() - nY);
            oTile.resize(nPixelBytes * nWidth * nHeight);
            oAction(nX, nY, nWidth, nHeight, oTile);
        }
}

struct Picture
{
    IOPointer mpoIO;
    std::size_t mnPixelBytes;
    bool mbBits;
};

std::vector<Picture> ListPictures(krv::plugins::krvdsk::KrvdskDataset& oDataset)
{
    std::vector<Picture> oPictures;
    oPictures.push_back({IOPointer(oDataset.GetRasterIO({1, 2})), 2, false});
    oPictures.push_back({IOPointer(oDataset.GetRasterIO({3})), 4, false});
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetOverviewManager());
    oPictures.push_back({IOPointer(poLevels->GetOverviewIO(2, {1, 2})), 2, false});
    oPictures.push_back({IOPointer(oDataset.GetBitmapIO(oDataset.GetBitmapList())), 1, true});
    return oPictures;
}

void WriteState(krv::plugins::krvdsk::KrvdskDataset& oDataset, unsigned int nState)
{
    unsigned int nImage = 0;
    for (const Picture& oPicture : ListPictures(oDataset))
    {
        ForEachTile(*oPicture.mpoIO, oPicture.mnPixelBytes,
                    [&](unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight, auto& oTile)
                    {
                        for (std::size_t n = 0; n < oTile.size(); ++n)
                            oTile[n] = ByteAt(nState, nImage + nX + nY * 7, n, oPicture.mbBits);
                        oPicture.mpoIO->WriteWindow(nX, nY, nWidth, nHeight, oTile.data());
                    });
        ++nImage;
    }
    AuxiliaryData oRecord = oDataset.ReadAuxiliaryData();
    oRecord.SetFileMetadataValue("state", std::to_string(nState));
    oRecord.SetFileMetadataValue("filler", std::string(nState * 37 % 3000, 'x'));
    oDataset.WriteAuxiliaryData(oRecord);
}

unsigned int TellState(krv::plugins::krvdsk::KrvdskDataset& oDataset)
{
    return static_cast<unsigned int>(std::stoul(oDataset.ReadAuxiliaryData().GetFileMetadataValue("state")));
}

// The bytes that are not those of the state.
std::size_t CountWrong(krv::plugins::krvdsk::KrvdskDataset& oDataset, unsigned int nState)
{
    std::size_t nWrong = 0;
    unsigned int nImage = 0;
    for (const Picture& oPicture : ListPictures(oDataset))
    {
        ForEachTile(*oPicture.mpoIO, oPicture.mnPixelBytes,
                    [&](unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight, auto& oTile)
                    {
                        oPicture.mpoIO->ReadWindow(nX, nY, nWidth, nHeight, oTile.data());
                        for (std::size_t n = 0; n < oTile.size(); ++n)
                            nWrong += oTile[n] != ByteAt(nState, nImage + nX + nY * 7, n, oPicture.mbBits);
                    });
        ++nImage;
    }
    return nWrong;
}

NativePointer CreateState(const std::string& fileName, const char* pOptions, unsigned int nState)
{
    NativePointer poDataset = CreateNative(fileName, pOptions, WIDTH, HEIGHT, {eDT_8U, eDT_8U, eDT_32R});
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(poDataset->GetOverviewManager());
    poLevels->CreateLevel(2);
    poDataset->CreateBitmap();
    WriteState(*poDataset, nState);
    return poDataset;
}

// What the processes tell each other.
struct Shared
{
    std::atomic<unsigned int> mnAcknowledged;
    std::atomic<bool> mbDone;
    std::atomic<unsigned int> mnRead[READERS];
};

// Each opening sees one state to its end, and none before the one that was acknowledged when it began.
int ReadUntilDone(const std::string& fileName, Shared& oShared, unsigned int nReader)
{
    Random oRandom = MakeRandom(100 + nReader);
    while (!oShared.mbDone)
    {
        const unsigned int nLeast = oShared.mnAcknowledged;
        const NativePointer poDataset = OpenNative(fileName);
        const unsigned int nState = TellState(*poDataset), nMost = oShared.mnAcknowledged + 1;
        for (unsigned int nTime = 1 + oRandom() % 3; nTime > 0; --nTime)
        {
            const std::size_t nWrong = CountWrong(*poDataset, nState);
            if (nWrong != 0 || nState < nLeast || nState > nMost)
            {
                std::cerr << "state " << nState << " of " << nLeast << " to " << nMost << ": " << nWrong
                          << " bytes are wrong" << std::endl;
                return 1;
            }
            ++oShared.mnRead[nReader];
            std::this_thread::sleep_for(std::chrono::microseconds(oRandom() % 3000));
        }
    }
    return 0;
}

// The exit code of a process that does it.
int InAProcess(const std::function<int()>& oAction)
{
    const pid_t nChild = ::fork();
    if (nChild != 0)
    {
        int nStatus = 0;
        ::waitpid(nChild, &nStatus, 0);
        return WIFEXITED(nStatus) ? WEXITSTATUS(nStatus) : -1;
    }
    ::_exit(oAction());
}

// KRV_SOAK_ROUNDS says for how long.
TEST(KrvdskReaders, EightProcessesSeeWholeStatesBesideAWriter)
{
    const TempFolder oFolder;
    void* const pMemory = ::mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(pMemory, MAP_FAILED);
    Random oRandom = MakeRandom(99);
    for (const char* const pKind : KINDS)
    {
        const std::string fileName = oFolder.File("shared.krv");
        std::filesystem::remove(fileName);
        auto& oShared = *new (pMemory) Shared{};
        CreateState(fileName, pKind, 0)->Close();
        std::vector<pid_t> oReaders;
        for (unsigned int nReader = 0; nReader < READERS; ++nReader)
        {
            oReaders.push_back(::fork());
            if (oReaders.back() != 0)
                continue;
            int nCode = 1;
            try
            {
                nCode = ReadUntilDone(fileName, oShared, nReader);
            }
            catch (const std::exception& oError)
            {
                std::cerr << oError.what() << std::endl;
            }
            ::_exit(nCode);
        }
        unsigned int nState = 0;
        const unsigned int nLast = 4 * Rounds();
        while (nState < nLast)
        {
            const NativePointer poWriter = OpenNative(fileName, eUpdate);
            for (unsigned int nLeft = 1 + oRandom() % 20; nLeft > 0 && nState < nLast; --nLeft)
            {
                WriteState(*poWriter, ++nState);
                if (nLeft == 1 || nState == nLast)
                    poWriter->Close();
                else
                    poWriter->Synchronize();
                oShared.mnAcknowledged = nState;
                std::this_thread::sleep_for(std::chrono::microseconds(oRandom() % 2000));
            }
        }
        oShared.mbDone = true;
        for (unsigned int nReader = 0; nReader < READERS; ++nReader)
        {
            int nStatus = 0;
            ::waitpid(oReaders[nReader], &nStatus, 0);
            EXPECT_EQ(nStatus, 0) << pKind;
            EXPECT_GT(oShared.mnRead[nReader], 0U);
        }
        const NativePointer poLeft = OpenNative(fileName);
        EXPECT_TRUE(poLeft->Verify({}).empty());
        EXPECT_LT(std::filesystem::file_size(fileName), 20U << 20) << "room is not used again";
    }
    ::munmap(pMemory, sizeof(Shared));
}

// The power fails right after each of them was reported as done.
TEST(KrvdskReaders, OfAThousandSynchronisationsNoneIsLost)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("a.krv"), crashed = oFolder.File("crashed.krv");
    std::mt19937 oRandom(FromEnvironment("KRV_SOAK_SEED", 1));
    unsigned int nDone = 0;
    const auto WritePixel = [](krv::plugins::krvdsk::KrvdskDataset& oDataset, unsigned int nState)
    {
        const IOPointer oIO(oDataset.GetRasterIO({1}));
        oIO->WriteWindow(nState % 48, nState / 48 % 32, 1U, 1U, reinterpret_cast<unsigned char*>(&nState));
    };
    while (nDone < 1000)
    {
        // A file of its own now and then: what the disk is asked for is gone through from its begin each time.
        CreateNative(fileName, "BLOCKXSIZE=16 BLOCKYSIZE=16", 48, 32, {eDT_32U})->Close();
        std::string before = krv::conformance::ReadFile(fileName);
        const Recording oRecording;
        const NativePointer poWriter = OpenNative(fileName, eUpdate);
        for (int nTime = 0; nTime < 50; ++nTime)
        {
            WritePixel(*poWriter, ++nDone);
            poWriter->Synchronize();
            WriteAnew(crashed, Crash(before, oRecording.GetCalls(), oRecording.GetCalls().size(), oRandom));
            ASSERT_EQ(Tell(*OpenNative(crashed)), Tell(*poWriter)) << nDone;
        }
        poWriter->Close();
    }
}

TEST(KrvdskReaders, AFullDiskAMissingFolderAndAFileThatIsGoneAreReported)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("f/full.krv");
    std::signal(SIGXFSZ, SIG_IGN);
    rlimit oOld = {};
    ::getrlimit(RLIMIT_FSIZE, &oOld);
    const rlimit oSmall{100000, oOld.rlim_max};
    std::string told;
    {
        const NativePointer poDataset = CreateState(fileName, KINDS[0], 1);
        poDataset->Synchronize();
        told = Tell(*OpenNative(fileName));
        ::setrlimit(RLIMIT_FSIZE, &oSmall);
        EXPECT_EQ(Error(
                      [&]
                      {
                          WriteState(*poDataset, 2);
                          poDataset->Synchronize();
                      })
                      .find("io: " + fileName + ": writing failed: File too large"),
                  0U);
        EXPECT_EQ(Tell(*OpenNative(fileName)), told);
        ::setrlimit(RLIMIT_FSIZE, &oOld);
        // What failed can be done again once there is room.
        WriteState(*poDataset, 3);
        poDataset->Synchronize();
        EXPECT_EQ(CountWrong(*OpenNative(fileName), 3), 0U);
        ::setrlimit(RLIMIT_FSIZE, &oSmall);
        EXPECT_THROW(
            {
                WriteState(*poDataset, 4);
                poDataset->Close();
            },
            krv::IOException);
        ::setrlimit(RLIMIT_FSIZE, &oOld);
    }
    EXPECT_EQ(CountWrong(*OpenNative(fileName), 3), 0U);
    EXPECT_EQ(TellState(*OpenNative(fileName, eUpdate)), 3U);

    const NativePointer poNew = CreateState(oFolder.File("gone/a.krv"), KINDS[0], 1);
    std::filesystem::remove_all(oFolder.GetPath() + "/gone");
    EXPECT_THROW(poNew->Synchronize(), krv::IOException);
    const NativePointer poRemoved = OpenNative(fileName, eUpdate);
    const NativePointer poReader = OpenNative(fileName);
    std::filesystem::remove(fileName);
    WriteState(*poRemoved, 5);
    EXPECT_NE(Error([&] { poRemoved->Synchronize(); }).find("was removed or replaced while it was being written"),
              std::string::npos);
    EXPECT_EQ(CountWrong(*poReader, 3), 0U); // as long as it has it open
    EXPECT_THROW(CreateState(oFolder.GetPath() + "/none/a.krv", "", 1), krv::FileException);
}

TEST(KrvdskReaders, AFileHasOneWriterWhoHasTheRightTo)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("one.krv");
    const NativePointer poWriter = CreateState(fileName, KINDS[0], 7);
    poWriter->Synchronize();
    const auto Update = [&fileName]
    {
        return Error([&] { OpenNative(fileName, eUpdate); });
    };
    const std::string second = "io: " + fileName + ": is being written by another program or dataset";
    EXPECT_EQ(Update(), second);
    EXPECT_EQ(InAProcess([&] { return Update() == second ? 0 : 1; }), 0);
    EXPECT_EQ(CountWrong(*OpenNative(fileName), 7), 0U);
    poWriter->Close();
    EXPECT_EQ(Update(), "");

    std::filesystem::permissions(fileName, std::filesystem::perms(0444));
    std::filesystem::permissions(oFolder.GetPath(), std::filesystem::perms(0555));
    const auto AsNobody = [&]
    {
        // Who may do everything is not refused.
        if (::geteuid() == 0 && ::setuid(65534) != 0)
            return 2;
        if (Update() != "io: " + fileName + ": cannot be opened: Permission denied")
            return 3;
        const std::string created = Error([&] { CreateState(oFolder.File("two.krv"), "", 1)->Close(); });
        return created.find("Permission denied") == std::string::npos ? 4 : CountWrong(*OpenNative(fileName), 7) != 0;
    };
    EXPECT_EQ(InAProcess(AsNobody), 0);
    std::filesystem::permissions(oFolder.GetPath(), std::filesystem::perms(0755));
    const std::string bytes = krv::conformance::ReadFile(fileName);
    const NativePointer poRead = OpenNative(fileName);
    EXPECT_THROW(WriteState(*poRead, 8), krv::DataException);
    EXPECT_THROW(poRead->CreateBitmap(), krv::DataException);
    EXPECT_THROW(poRead->DeleteChannel(1), krv::DataException);
    EXPECT_THROW(poRead->SetEncodedForm(1, poRead->GetEncodedForm(1)), krv::DataException);
    EXPECT_EQ(krv::conformance::ReadFile(fileName), bytes);
}

} // namespace
