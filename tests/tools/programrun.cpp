#include "tests/tools/programrun.h"

#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <fstream>
#include <stdexcept>
#include <thread>

extern char** environ;

namespace krv::test
{

using krv::conformance::ReadFile;

namespace
{

std::vector<char*> Pointers(std::vector<std::string>& oTexts)
{
    std::vector<char*> oPointers;
    for (std::string& text : oTexts)
        oPointers.push_back(text.data());
    oPointers.push_back(nullptr);
    return oPointers;
}

// Whether the signals that a process has a handler for, a hexadecimal mask, have SIGINT among them.
bool CatchesInterrupts(pid_t nProcess)
{
    std::ifstream oStatus("/proc/" + std::to_string(nProcess) + "/status");
    for (std::string word; oStatus >> word;)
        if (word == "SigCgt:" && oStatus >> word)
            return (std::stoull(word, nullptr, 16) >> (SIGINT - 1) & 1) != 0;
    return false;
}

} // namespace

ProgramRun RunProgram(const std::string& program, const std::vector<std::string>& oArguments,
                      const std::vector<std::string>& oEnvironment, unsigned int nInterruptAfterMs)
{
    const krv::conformance::TempFolder oFolder;
    const std::string output = oFolder.File("output"), errors = oFolder.File("errors");
    posix_spawn_file_actions_t oActions;
    posix_spawn_file_actions_init(&oActions);
    posix_spawn_file_actions_addopen(&oActions, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&oActions, 1, output.c_str(), O_WRONLY | O_CREAT, 0600);
    posix_spawn_file_actions_addopen(&oActions, 2, errors.c_str(), O_WRONLY | O_CREAT, 0600);
    std::vector<std::string> oAllArguments{program};
    oAllArguments.insert(oAllArguments.end(), oArguments.begin(), oArguments.end());
    std::vector<std::string> oAllEnvironment = oEnvironment; // the first of a name counts
    for (char** p = environ; *p != nullptr; ++p)
        oAllEnvironment.emplace_back(*p);
    pid_t nProcess = 0;
    const int nError = posix_spawn(&nProcess, program.c_str(), &oActions, nullptr, Pointers(oAllArguments).data(),
                                   Pointers(oAllEnvironment).data());
    posix_spawn_file_actions_destroy(&oActions);
    if (nError != 0)
        throw std::runtime_error(program + " could not be started");
    if (nInterruptAfterMs != 0)
    {
        // Before it listens the signal would just kill it, however busy the machine is.
        for (int nWait = 0; nWait < 6000 && !CatchesInterrupts(nProcess); ++nWait)
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        std::this_thread::sleep_for(std::chrono::milliseconds(nInterruptAfterMs));
        kill(nProcess, SIGINT);
    }
    int nStatus = 0;
    waitpid(nProcess, &nStatus, 0);
    return {WIFEXITED(nStatus) ? WEXITSTATUS(nStatus) : 128 + WTERMSIG(nStatus), ReadFile(output), ReadFile(errors)};
}

ProgramRun RunKrv(const std::vector<std::string>& oArguments, const std::vector<std::string>& oEnvironment)
{
    return RunProgram(KRV_PROGRAM, oArguments, oEnvironment);
}

void ExpectFailure(const ProgramRun& oRun, int nCode, const std::vector<std::string>& oWords)
{
    EXPECT_EQ(oRun.code, nCode) << oRun.errors;
    EXPECT_EQ(std::count(oRun.errors.begin(), oRun.errors.end(), '\n'), 1) << oRun.errors;
    EXPECT_TRUE(oRun.output.empty()) << oRun.output;
    for (const std::string& word : oWords)
        EXPECT_NE(oRun.errors.find(word), std::string::npos) << word << " is not in: " << oRun.errors;
}

void ExpectRefusals(const std::string& verb, const std::vector<Refusal>& oRefusals)
{
    for (const Refusal& oRefusal : oRefusals)
    {
        std::vector<std::string> oArguments{verb};
        oArguments.insert(oArguments.end(), oRefusal.moArguments.begin(), oRefusal.moArguments.end());
        ExpectFailure(RunKrv(oArguments), oRefusal.mnCode, {oRefusal.moWord});
    }
}

} // namespace krv::test
