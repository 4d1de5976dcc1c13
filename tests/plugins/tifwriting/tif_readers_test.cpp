#include "tests/plugins/tif/tifsupport.h"
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

// Processes that open, wait and read while another one writes number after number over all pixels: each finds one
// number everywhere. What they leave is used again.
TEST(TifReaders, ReadersInOtherProcessesSeeOneStateEach)
{
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("p.tif");
    for (const char* pKind : KINDS)
    {
        SCOPED_TRACE(pKind);
        CreateTif(fileName, pKind, 300, 200, 1, krv::gobs::eDT_8U)->Close();
        std::vector<pid_t> oReaders;
        const std::string end = oFolder.File("end");
        for (unsigned int nReader = 0; nReader < 3; ++nReader)
            oReaders.push_back(Start(
                [&]
                {
                    std::mt19937 oRandom(nReader);
                    while (!std::filesystem::exists(end))
                    {
                        const TifPointer poDataset = OpenTif(fileName);
                        ::usleep(oRandom() % 3000);
                        const Bytes oPixels = ReadAll(*poDataset);
                        if (std::count(oPixels.begin(), oPixels.end(), oPixels[0]) != std::ssize(oPixels))
                            return 1;
                    }
                    return 0;
                }));
        const TifPointer poWriter = OpenTif(fileName, eUpdate);
        const auto Write = [&](int nStates)
        {
            for (int nState = 0; nState < nStates; ++nState)
            {
                WriteAll(*poWriter, Bytes(300 * 200, static_cast<unsigned char>(nState)));
                poWriter->Synchronize();
            }
            return std::filesystem::file_size(fileName);
        };
        Write(150);
        oFolder.Write("end", "");
        for (const pid_t nReader : oReaders)
            EXPECT_EQ(Wait(nReader), 0);
        std::filesystem::remove(end);
        const std::uintmax_t nBytes = Write(2);
        EXPECT_EQ(Write(20), nBytes) << "room that nobody reads is not used again";
    }
}

} // namespace
