// A program that is killed, and a disk that loses its power: what was synchronised is there, whole.
#include "datasources/interfaces/irasterio.h"
#include "tests/plugins/krvdsk/changes.h"
#include "tests/plugins/krvdsk/disk.h"
#include "tests/soak/soakrun.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <filesystem>
#include <iostream>
#include <set>
#include <thread>

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{

using namespace krv::test;
using krv::conformance::ReadFile;
using krv::conformance::TempFolder;
using namespace krv::gobs;

const Types MIXED = {eDT_8U, eDT_8U, eDT_8U, eDT_32R, eDT_C16S};
constexpr const char* KINDS[] = {"BLOCKXSIZE=32 BLOCKYSIZE=16", "BLOCKXSIZE=40 BLOCKYSIZE=30 COMPRESS=ZSTD LEVEL=1",
                                 "BLOCKXSIZE=64 BLOCKYSIZE=64 COMPRESS=LZ4 INTERLEAVE=BAND"};

// A state that was synchronised, and between which calls to the system that happened.
struct Commit
{
    std::size_t mnBegin;
    std::size_t mnEnd;
    std::string moTold;
};

// Makes changes of one way mostly, with a commit now and then, and tells which calls that made.
std::vector<Commit> Work(const std::string& fileName, Change eChange, std::mt19937& oRandom,
                         std::vector<DiskCall>& oCalls)
{
    const Recording oRecording;
    const NativePointer poDataset = OpenNative(fileName, eUpdate);
    std::vector<Commit> oCommits = {{0, 0, Tell(*poDataset)}};
    for (int nCommit = 0; nCommit < 6; ++nCommit)
    {
        for (int nStep = 0; nStep < 4; ++nStep)
            Make(*poDataset, nStep % 3 == 2 ? CHANGES[oRandom() % std::size(CHANGES)] : eChange, oRandom);
        Commit oCommit{oRecording.GetCalls().size(), 0, Tell(*poDataset)};
        if (nCommit == 5)
            poDataset->Close();
        else
            poDataset->Synchronize();
        oCommit.mnEnd = oRecording.GetCalls().size();
        oCommits.push_back(std::move(oCommit));
    }
    oCalls = oRecording.GetCalls();
    return oCommits;
}

// At every call to the system, ten times each: the last state that was synchronised, or the one on its way.
TEST(KrvdskSafety, APowerFailureLeavesAWholeState)
{
    std::mt19937 oRandom(FromEnvironment("KRV_SOAK_SEED", 1));
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("a.krv"), crashed = oFolder.File("crashed.krv");
    for (const Change eChange : CHANGES)
    {
        const char* const pKind = KINDS[static_cast<std::size_t>(eChange) % std::size(KINDS)];
        {
            const NativePointer poNew = CreateNative(fileName, pKind, 100, 70, MIXED);
            for (int nStep = 0; nStep < 6; ++nStep)
                Make(*poNew, CHANGES[nStep], oRandom);
            poNew->Close();
        }
        const std::string before = ReadFile(fileName);
        std::vector<DiskCall> oCalls;
        const std::vector<Commit> oCommits = Work(fileName, eChange, oRandom, oCalls);
        std::set<std::string> oSeen;
        for (std::size_t nCalls = 0; nCalls <= oCalls.size(); ++nCalls)
            for (int nTime = 0; nTime < 10; ++nTime)
            {
                const auto oNext = std::find_if(oCommits.begin(), oCommits.end(),
                                                [nCalls](const Commit& oCommit) { return oCommit.mnEnd > nCalls; });
                WriteAnew(crashed, Crash(before, oCalls, nCalls, oRandom));
                const NativePointer poLeft = OpenNative(crashed);
                const std::string told = Tell(*poLeft);
                const bool bUnderWay = oNext != oCommits.end() && oNext->mnBegin <= nCalls && told == oNext->moTold;
                ASSERT_TRUE(told == std::prev(oNext)->moTold || bUnderWay)
                    << pKind << ", call " << nCalls << " of " << oCalls.size() << "\n"
                    << told << "\ninstead of\n"
                    << std::prev(oNext)->moTold;
                oSeen.insert(told);
                if (nTime == 0 && nCalls % 8 == 0)
                {
                    ASSERT_TRUE(poLeft->Verify({}).empty());
                    // Whoever goes on with it starts from that state.
                    const NativePointer poMore = OpenNative(crashed, eUpdate);
                    Make(*poMore, eChange, oRandom);
                    const std::string more = Tell(*poMore);
                    poMore->Close();
                    ASSERT_EQ(Tell(*OpenNative(crashed)), more);
                    ASSERT_EQ(Tell(*poLeft), told);
                }
            }
        for (const Commit& oCommit : oCommits)
            EXPECT_TRUE(oSeen.contains(oCommit.moTold)) << "a state was never found";
    }
}

// Says in a pipe what the next state will be, and when it is there.
void WorkUntilKilled(const std::string& fileName, const char* pKind, unsigned int nSeed, int nPipe)
{
    std::mt19937 oRandom(nSeed);
    const auto Say = [nPipe](char nWhat, const std::string& told)
    {
        const std::string line = nWhat + std::to_string(std::hash<std::string>()(told)) + "\n";
        static_cast<void>(::write(nPipe, line.data(), line.size()));
    };
    for (;;)
    {
        const bool bNew = !std::filesystem::exists(fileName);
        const NativePointer poDataset =
            bNew ? CreateNative(fileName, pKind, 160, 120, MIXED) : OpenNative(fileName, eUpdate);
        for (unsigned int nCommit = 1 + oRandom() % 6; nCommit > 0; --nCommit)
        {
            for (unsigned int nStep = 1 + oRandom() % 5; nStep > 0; --nStep)
                Make(*poDataset, CHANGES[oRandom() % std::size(CHANGES)], oRandom);
            const std::string told = Tell(*poDataset);
            Say('?', told);
            if (nCommit == 1)
                poDataset->Close();
            else
                poDataset->Synchronize();
            Say('!', told);
        }
    }
}

std::string Listen(int nPipe, pid_t nWriter, std::mt19937& oRandom)
{
    std::string heard;
    char aBytes[4096];
    // Not before the first state is there, in the file as it is made or in the one that was there.
    const auto oEnd = std::chrono::steady_clock::now() + std::chrono::seconds(60);
    bool bKilled = false;
    auto oKill = oEnd;
    for (;;)
    {
        if (!bKilled && std::chrono::steady_clock::now() >= oKill)
        {
            ::kill(nWriter, SIGKILL);
            bKilled = true;
        }
        pollfd oPoll = {nPipe, POLLIN, 0};
        ::poll(&oPoll, 1, 1);
        if (oPoll.revents != 0)
        {
            const ssize_t nRead = ::read(nPipe, aBytes, sizeof(aBytes));
            if (nRead <= 0)
                return heard;
            heard.append(aBytes, static_cast<std::size_t>(nRead));
        }
        if (oKill == oEnd && heard.find('?') != std::string::npos)
            oKill = std::chrono::steady_clock::now() + std::chrono::microseconds(oRandom() % 40000);
    }
}

// KRV_KILL_RUNS says how often.
TEST(KrvdskSafety, AKilledWriterLeavesTheLastSynchronisedState)
{
    const unsigned int nRuns = FromEnvironment("KRV_KILL_RUNS", 6);
    std::mt19937 oRandom(FromEnvironment("KRV_SOAK_SEED", 1));
    const TempFolder oFolder;
    const std::string fileName = oFolder.File("k.krv");
    std::size_t nUnderWay = 0, nKept = 0;
    std::size_t nLast = 0; // what the file told
    for (unsigned int nRun = 0; nRun < nRuns; ++nRun)
    {
        if (nRun % 8 == 0)
            std::filesystem::remove(fileName);
        const bool bNew = !std::filesystem::exists(fileName);
        int aPipe[2] = {};
        ASSERT_EQ(::pipe(aPipe), 0);
        const unsigned int nSeed = oRandom();
        const pid_t nWriter = ::fork();
        if (nWriter == 0)
        {
            try
            {
                WorkUntilKilled(fileName, KINDS[nRun / 8 % std::size(KINDS)], nSeed, aPipe[1]);
            }
            catch (const std::exception& oError)
            {
                std::cerr << oError.what() << std::endl;
            }
            ::_exit(1);
        }
        ::close(aPipe[1]);
        const std::string heard = Listen(aPipe[0], nWriter, oRandom);
        ::close(aPipe[0]);
        int nStatus = 0;
        ::waitpid(nWriter, &nStatus, 0);
        ASSERT_TRUE(WIFSIGNALED(nStatus) && WTERMSIG(nStatus) == SIGKILL) << "the writer failed before it was killed";
        const std::size_t nDone = heard.rfind('!'), nAsked = heard.rfind('?');
        const auto Number = [&heard](std::size_t nAt)
        {
            return nAt == std::string::npos ? 0 : std::strtoull(heard.c_str() + nAt + 1, nullptr, 10);
        };
        if (!std::filesystem::exists(fileName))
        {
            ASSERT_TRUE(bNew && nDone == std::string::npos) << heard;
            continue;
        }
        const NativePointer poLeft = OpenNative(fileName);
        const std::size_t nTold = std::hash<std::string>()(Tell(*poLeft));
        const std::size_t nWanted = nDone == std::string::npos ? nLast : Number(nDone);
        ASSERT_TRUE(nTold == nWanted || nTold == Number(nAsked)) << "run " << nRun << " " << heard;
        ASSERT_TRUE(poLeft->Verify({}).empty());
        nKept += nTold == nWanted;
        nUnderWay += nTold != nWanted;
        nLast = nTold;
    }
    std::cout << nKept << " kills left the last state, " << nUnderWay << " the one on its way\n";
    EXPECT_GT(nKept + nUnderWay, nRuns / 2) << "no writer lived long enough";
}

} // namespace
