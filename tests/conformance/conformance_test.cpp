#include "tools/conformance/conformance.h"

#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <sys/wait.h>

#include <cstdlib>

using namespace krv::conformance;

namespace
{

std::string Fixture(const std::string& name)
{
    return std::string(KRV_TEST_PLUGINS) + "/" + name + ".so";
}

// The checks that fail for the sloppy plug-in with a fault.
std::vector<std::string> FailedChecks(const char* pFault, const std::string& sample)
{
    setenv("KRV_SLOPPY", pFault, 1);
    const Plugin oPlugin(Fixture("sloppy"));
    std::vector<std::string> oFailed;
    for (const Check& oCheck : GetChecks())
    {
        // Tiles have no guard bytes: writing beyond them ends the process.
        if (pFault == std::string("writes beyond the buffer") && oCheck.mpName == std::string("reader"))
            continue;
        if (!Run(oCheck, oPlugin, sample).empty())
            oFailed.emplace_back(oCheck.mpName);
    }
    unsetenv("KRV_SLOPPY");
    return oFailed;
}

int RunProgram(const std::string& arguments)
{
    const int nStatus = std::system((std::string(KRV_CONFORMANCE) + " " + arguments + " >/dev/null 2>&1").c_str());
    return WEXITSTATUS(nStatus);
}

} // namespace

// Datasets without a file behave as any other: what has to do with the bytes of a file aside.
TEST(Conformance, DatasetsWithoutAFilePass)
{
    const krv::conformance::TempFolder oFolder;
    const Plugin oPlugin(Fixture("fileless"));
    for (const char* const pKind : {"memory", "constant", "pairs"})
        for (const Check& oCheck : GetChecks())
        {
            const std::string name = oCheck.mpName;
            if (name == "writing" || name == "truncated" || name == "damaged")
                continue;
            for (const std::string& finding :
                 krv::conformance::Run(oCheck, oPlugin, oFolder.Write(pKind, std::string("FILELESS ") + pKind)))
                ADD_FAILURE() << pKind << ", " << name << ": " << finding;
        }
}

// Every check finds its faults, and a good plug-in passes them all.
TEST(Conformance, ChecksFindWhatIsWrong)
{
    const krv::conformance::TempFolder oFolder;
    const std::pair<const char*, std::vector<std::string>> FAULTS[] = {
        {"none", {}},
        {"lower-case name", {"description"}},
        {"claims all files", {"identify"}},
        {"throws for short headers", {"identify"}},
        {"describes any channel", {"dataset"}},
        {"metadata without channels", {"metadata"}},
        {"clears the buffer", {"windows", "bitmaps"}},
        {"reads the whole window", {"windows", "bitmaps"}},
        {"clips the short form", {"windows", "bitmaps"}},
        {"writes beyond the buffer", {"windows", "channels", "bitmaps", "life", "writing"}},
        {"sorts the channels", {"channels"}},
        {"levels in disorder", {"overviews"}},
        {"bitmaps of 255", {"bitmaps"}},
        {"leaves files open", {"life", "truncated", "damaged"}},
        {"writes what is read only", {"life"}},
        {"clips what it writes", {"writing"}},
        {"foreign exception for short files", {"truncated"}},
        {"null for short files", {"truncated"}},
    };
    for (const auto& [pFault, oChecks] : FAULTS)
    {
        const std::string sample = oFolder.Write("sample.sloppy", "SLOPPY, all of it\n");
        EXPECT_EQ(FailedChecks(pFault, sample), oChecks) << pFault;
    }
}

TEST(Conformance, TheProgramSaysHowItEnded)
{
    const krv::conformance::TempFolder oFolder;
    const std::string sample = oFolder.Write("sample.sloppy", "SLOPPY, all of it\n");
    const std::string good = "--plugin " + Fixture("sloppy") + " --file " + sample;
    EXPECT_EQ(RunProgram(good), 0);
    setenv("KRV_SLOPPY", "claims all files", 1);
    EXPECT_EQ(RunProgram(good), 1);
    EXPECT_EQ(RunProgram(good + " --check windows --check life"), 0);
    unsetenv("KRV_SLOPPY");
    for (const char* pBroken : {"missingversion", "missingregistration", "wrongversion", "nullbuilder", "absent"})
        EXPECT_EQ(RunProgram("--plugin " + Fixture(pBroken) + " --file " + sample), 1) << pBroken;
    for (const char* pUsage : {"", "--plugin", "--file x", "--plugin x --nonsense y"})
        EXPECT_EQ(RunProgram(pUsage), 2) << pUsage;
}
