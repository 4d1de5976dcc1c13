#include "tools/conformance/conformance.h"

#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>

// krv_conformance --plugin LIBRARY.so --file SAMPLE [--file SAMPLE ...] [--check NAME ...]
// Checks a format plug-in library over files of its format. Exit 0: all passed, 1: something failed, 2: wrong usage.
namespace
{

constexpr char USAGE[] =
    "usage: krv_conformance --plugin LIBRARY.so --file SAMPLE [--file SAMPLE ...] [--check NAME ...]\n"
    "Checks a format plug-in library over files of its format.\n\nchecks:\n";

int ShowUsage()
{
    std::fputs(USAGE, stderr);
    for (const auto& oCheck : krv::conformance::GetChecks())
        std::fprintf(stderr, "  %-12s %s\n", oCheck.mpName, oCheck.mpMeaning);
    return 2;
}

bool IsWanted(const std::vector<std::string>& oNames, const char* pName)
{
    for (const std::string& name : oNames)
        if (name == pName)
            return true;
    return oNames.empty();
}

bool RunHere(const krv::conformance::Check& oCheck, const krv::conformance::Plugin& oPlugin, const std::string& file)
{
    const auto oFindings = Run(oCheck, oPlugin, file);
    std::puts(oFindings.empty() ? "passed" : "FAILED");
    for (const std::string& finding : oFindings)
        std::printf("      %s\n", finding.c_str());
    return oFindings.empty();
}

// In a process of its own: a plug-in that crashes in one check is still seen in the others.
bool RunApart(const krv::conformance::Check& oCheck, const krv::conformance::Plugin& oPlugin, const std::string& file)
{
    const pid_t nChild = fork();
    if (nChild < 0)
        return RunHere(oCheck, oPlugin, file);
    if (nChild == 0)
        std::exit(RunHere(oCheck, oPlugin, file) ? 0 : 1);
    int nStatus = 0;
    waitpid(nChild, &nStatus, 0);
    if (!WIFEXITED(nStatus))
        std::printf("FAILED\n      crashed (%s); with --check %s alone it does so in this process, for a debugger\n",
                    strsignal(WTERMSIG(nStatus)), oCheck.mpName);
    return WIFEXITED(nStatus) && WEXITSTATUS(nStatus) == 0;
}

bool RunAll(const krv::conformance::Plugin& oPlugin, const std::string& file, const std::vector<std::string>& oNames)
{
    bool bPassed = true;
    std::printf("%s\n", file.c_str());
    for (const auto& oCheck : krv::conformance::GetChecks())
    {
        if (!IsWanted(oNames, oCheck.mpName))
            continue;
        std::printf("  %-12s ", oCheck.mpName);
        std::fflush(stdout);
        bPassed = (oNames.size() == 1 ? RunHere : RunApart)(oCheck, oPlugin, file) && bPassed;
    }
    return bPassed;
}

} // namespace

int main(int nArguments, char** pArguments)
{
    std::string plugin;
    std::vector<std::string> oFiles;
    std::vector<std::string> oNames;
    for (int nArgument = 1; nArgument < nArguments; nArgument += 2)
    {
        const std::string option = pArguments[nArgument];
        if (nArgument + 1 == nArguments)
            return ShowUsage();
        const std::string value = pArguments[nArgument + 1];
        if (option == "--plugin")
            plugin = value;
        else if (option == "--file")
            oFiles.push_back(value);
        else if (option == "--check")
            oNames.push_back(value);
        else
            return ShowUsage();
    }
    if (plugin.empty() || oFiles.empty())
        return ShowUsage();
    try
    {
        const krv::conformance::Plugin oPlugin(plugin);
        bool bPassed = true;
        for (const std::string& file : oFiles)
            bPassed = RunAll(oPlugin, file, oNames) && bPassed;
        return bPassed ? 0 : 1;
    }
    catch (const std::exception& oException)
    {
        std::fprintf(stderr, "%s: %s\n", plugin.c_str(), oException.what());
        return 1;
    }
}
