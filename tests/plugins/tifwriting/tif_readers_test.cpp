// A writer and readers of one file at a time, in one process and in several, and which room it uses again.

#include "datasources/metadata/auxiliarydata.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/tiffwriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <cstddef>
#include <filesystem>
#include <iostream>
#include <list>

#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

using namespace krv::test;
using krv::datasources::AuxiliaryData;

constexpr const char* KINDS[] = {"BLOCKXSIZE=32 BLOCKYSIZE=32", "COMPRESS=LZW TILED=NO BLOCKYSIZE=9 INTERLEAVE=BAND",
                                 "COMPRESS=ZSTD BLOCKXSIZE=64 BLOCKYSIZE=64 BIGTIFF=YES"};

// Runs something in a process of its own; the result is that of the function.
template <typename Work>
pid_t Start(Work oWork)
{
    const pid_t nChild = ::fork();
    if (nChild == 0)
    {
        int nResult = 99;
        try
        {
            nResult = oWork();
        }
        catch (const std::exception& oError)
        {
            std::cerr << oError.what() << std::endl;
        }
        ::_exit(nResult);
    }
    return nChild;
}

int Wait(pid_t nChild)
{
    int nStatus = 0;
    ::waitpid(nChild, &nStatus, 0);
    return WIFEXITED(nStatus) ? WEXITSTATUS(nStatus) : 1000 + nStatus;
}

// From now on a call to the system fails in this process, with a given second argument or any.
void Deny(unsigned int nCall, unsigned int nError, int nSecond = -1)
{
    const auto nCompared = static_cast<unsigned int>(nSecond);
    const auto nSkip = static_cast<unsigned char>(nSecond < 0 ? 0 : 1);
    sock_filter aRules[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, nCall, 0, 3),
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, args[1])),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, nCompared, 0, nSkip),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | nError),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    sock_fprog oProgram = {sizeof(aRules) / sizeof(aRules[0]), aRules};
    if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0 || ::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &oProgram) != 0)
        ::_exit(77);
}

constexpr int DENIED = 77;

// Readers that are opened now and read later, beside a writer that changes the file in between.
bool ReadersSeeTheirState(const std::string& fileName, const char* pKind, unsigned int nSeed)
{
    struct Opened
    {
        TifPointer mpoDataset;
        Bytes moExpected;
    };
    std::list<Opened> oReaders;
    std::mt19937 oRandom(nSeed);
    CreateTif(fileName, pKind, 200, 150, 2, krv::gobs::eDT_8U)->Close();
    Bytes oPixels(200 * 150 * 2, 0), oCommitted = oPixels;
    for (int nOpening = 0; nOpening < 4; ++nOpening)
    {
        const TifPointer poWriter = OpenTif(fileName, eUpdate);
        for (int nStep = 0; nStep < 20; ++nStep)
        {
            oReaders.push_back({OpenTif(fileName), oCommitted});
            const Bytes oNew = MakePixels(200, 150, 2, krv::gobs::eDT_8U, oRandom());
            const std::size_t nFrom = oRandom() % 150, nRows = oRandom() % (150 - nFrom) + 1;
            std::copy_n(oNew.begin() + static_cast<std::ptrdiff_t>(nFrom * 400), nRows * 400,
                        oPixels.begin() + static_cast<std::ptrdiff_t>(nFrom * 400));
            IOPointer(poWriter->GetRasterIO({1, 2}))
                ->WriteWindow(0u, static_cast<unsigned int>(nFrom), 200u, static_cast<unsigned int>(nRows),
                              &oPixels[nFrom * 400]);
            if (nStep == 19 || oRandom() % 2 == 0)
            {
                poWriter->Synchronize();
                oCommitted = oPixels;
            }
            while (oReaders.size() > 3)
            {
                const auto oReader = std::next(oReaders.begin(), oRandom() % 3);
                if (ReadAll(*oReader->mpoDataset) != oReader->moExpected)
                    return false;
                oReaders.erase(oReader);
            }
        }
    }
    return true;
}

TEST(TifReaders, AReaderSeesTheStateThatItOpened)
{
    const TempFolder oFolder;
    for (unsigned int nSeed = 0; nSeed < 9; ++nSeed)
        EXPECT_TRUE(ReadersSeeTheirState(oFolder.File("r.tif"), KINDS[nSeed % 3], nSeed)) << "seed " << nSeed;
}

// Where a file system has no locks nothing is used again that a reader could have opened.
TEST(TifReaders, WithoutLocksToo)
{
    const TempFolder oFolder;
    for (const int nCommand : {F_OFD_SETLK, F_OFD_GETLK})
    {
        const int nResult = Wait(Start(
            [&]
            {
                Deny(SYS_fcntl, ENOLCK, nCommand);
                return ReadersSeeTheirState(oFolder.File("n.tif"), KINDS[0], 5) ? 0 : 1;
            }));
        if (nResult == DENIED)
            GTEST_SKIP() << "this system cannot deny calls";
        EXPECT_EQ(nResult, 0);
    }
}

// Writes other pixels over all of a file, opened anew, and returns its size.
std::uintmax_t Rewrite(const std::string& fileName, unsigned int nSeed)
{
    const TifPointer poWriter = OpenTif(fileName, eUpdate);
    const Bytes oPixels = MakePixels(poWriter->GetWidth(), poWriter->GetHeight(), 1, krv::gobs::eDT_8U, nSeed);
    WriteAll(*poWriter, oPixels);
    AuxiliaryData oData = poWriter->ReadAuxiliaryData();
    oData.SetFileMetadataValue("Turn", std::string(nSeed * 10, 'x'));
    poWriter->WriteAuxiliaryData(oData);
    poWriter->Close();
    EXPECT_EQ(Judge(fileName).moComplaints, "");
    EXPECT_TRUE(Judge(fileName).moPixels == oPixels);
    return std::filesystem::file_size(fileName);
}

std::optional<std::uint64_t> Unused(const std::string& fileName)
{
    return OpenTif(fileName)->GetUnusedBytes();
}

TEST(TifRoom, WhatEarlierOpeningsGaveUpIsUsedAgain)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("g.tif");
    for (const std::string kind : {"", "COMPRESS=LZW", "LAYOUT=COG COMPRESS=ZSTD BIGTIFF=YES"})
    {
        SCOPED_TRACE(kind);
        CreateTif(fileName, "BLOCKXSIZE=32 BLOCKYSIZE=32 " + kind, 300, 200, 1, krv::gobs::eDT_8U)->Close();
        EXPECT_EQ(Unused(fileName).value_or(99) / 20000, 0u);
        Rewrite(fileName, 1);
        const std::uintmax_t nOnce = std::filesystem::file_size(fileName);
        for (unsigned int nSeed = 2; nSeed < 9; ++nSeed)
            EXPECT_LT(Rewrite(fileName, nSeed), 2 * nOnce + 30000) << nSeed;
        EXPECT_GT(Unused(fileName).value_or(0), nOnce / 2);
        EXPECT_LT(Unused(fileName).value_or(0), 2 * nOnce);
        // A reader keeps what it reads from one opening of the writer to the next.
        const TifPointer poReader = OpenTif(fileName);
        const Bytes oPixels = Judge(fileName).moPixels;
        for (unsigned int nSeed = 9; nSeed < 13; ++nSeed)
            Rewrite(fileName, nSeed);
        EXPECT_TRUE(ReadAll(*poReader) == oPixels);
        std::filesystem::remove(fileName);
    }
}

// Bytes that no tag known here names may be somebody's: where others wrote, nothing is ever overwritten, whether they
// made the file, added to it, or changed what this library had made.
TEST(TifRoom, WhatOthersWroteIsNeverOverwritten)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("o.tif");
    const auto KeepsAll = [&](const char* pHow)
    {
        SCOPED_TRACE(pHow);
        const std::string bytes = ReadFile(fileName);
        std::uintmax_t nFirst = 0;
        for (unsigned int nSeed = 1; nSeed < 6; ++nSeed)
        {
            const std::uintmax_t nBytes = Rewrite(fileName, nSeed);
            nFirst = nSeed == 2 ? nBytes : nFirst;
            EXPECT_TRUE(nSeed < 3 || nBytes < nFirst + 2000) << nBytes << " after " << nFirst;
        }
        // All but the place of the first directory.
        EXPECT_TRUE(ReadFile(fileName).substr(8, bytes.size() - 8) == bytes.substr(8));
    };
    const auto Append = [&](std::size_t nBytes)
    {
        oFolder.Write("o.tif", ReadFile(fileName) + std::string(nBytes, 'f'));
    };
    {
        const TiffFile poFile = NewTiff(fileName);
        SetForm(poFile.get(), {.mnWidth = 300, .mnHeight = 200, .mnTileWidth = 32});
        WriteBlocks(poFile.get());
    }
    EXPECT_EQ(Unused(fileName), std::nullopt);
    Append(5001);
    KeepsAll("made elsewhere");

    CreateTif(fileName, "BLOCKXSIZE=32 BLOCKYSIZE=32", 300, 200, 1, krv::gobs::eDT_8U)->Close();
    for (unsigned int nSeed = 1; nSeed < 4; ++nSeed)
        Rewrite(fileName, nSeed);
    const std::string before = ReadFile(fileName);
    Append(7001);
    Rewrite(fileName, 4);
    Rewrite(fileName, 5);
    EXPECT_EQ(ReadFile(fileName).substr(before.size(), 7001), std::string(7001, 'f'));
    EXPECT_LT(std::filesystem::file_size(fileName), before.size() + 7001 + 2000) << "the rest is used again";

    {
        const TiffFile poChanged = NewTiff(fileName, "r+");
        TIFFSetField(poChanged.get(), TIFFTAG_SOFTWARE, "another program");
    }
    EXPECT_EQ(Unused(fileName), std::nullopt);
    KeepsAll("changed elsewhere");
}

// A file system may know one of the ways to take a free name, or none.
TEST(TifRoom, AFreeNameIsTakenWithoutTheSystemsHelpToo)
{
    const TempFolder oFolder;
    for (const bool bLinks : {true, false})
    {
        const std::string fileName = oFolder.File(bLinks ? "linked.tif" : "plain.tif");
        const int nResult = Wait(Start(
            [&]
            {
                Deny(SYS_renameat2, EINVAL);
#ifdef SYS_link
                if (!bLinks)
                    Deny(SYS_link, EPERM);
#endif
                if (!bLinks)
                    Deny(SYS_linkat, EPERM);
                const auto Make = [&](unsigned char nValue)
                {
                    TifPointer poDataset = CreateTif(fileName, "");
                    poDataset->KeepExisting();
                    poDataset->Create(20, 10, {krv::gobs::eDT_8U});
                    WriteAll(*poDataset, Bytes(200, nValue));
                    return poDataset;
                };
                const TifPointer poFirst = Make(1), poSecond = Make(2);
                poFirst->Close();
                try
                {
                    poSecond->Close();
                }
                catch (const krv::IOException&)
                {
                    return 0;
                }
                return 1;
            }));
        if (nResult == DENIED)
            GTEST_SKIP() << "this system cannot deny calls";
        EXPECT_EQ(nResult, 0);
        EXPECT_EQ(Judge(fileName).moPixels, Bytes(200, 1));
    }
    EXPECT_EQ(ListFolder(oFolder.GetPath()).size(), 2u);
}

} // namespace
