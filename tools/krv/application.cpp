#include "tools/krv/application.h"

#include "toolkit/nspio/warning.h"
#include "tools/krv/errors.h"
#include "tools/krv/helpformatter.h"
#include "tools/krv/interrupt.h"
#include "tools/krv/nearestword.h"
#include "tools/krv/threads.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace krv::tool
{

namespace
{

constexpr int INTERRUPTED = 130;

constexpr char FOOTER[] =
    "Examples:\n"
    "  krv info scene.tif                                everything known of a file\n"
    "  krv stats scene.tif --json                        statistics per channel, for other programs\n"
    "  krv view scene.tif look.png --size 800            a quick look\n"
    "  krv view \"loop.gif[page=3]\" look.png              a page of an animation\n"
    "  krv convert scene.tif copy.tif --options COMPRESS=ZSTD\n"
    "  krv overviews scene.tif                           overview levels, powers of two\n"
    "  krv edit scene.tif --no-data 0 --crs EPSG:32633   what the file says, in place\n"
    "  krv sample scene.tif 500020 5199990               values at points\n"
    "  krv doctor scene.tif                              why a file does or does not open\n"
    "`krv VERB --help` explains a verb.\n"
    "Exit code: 0 done; 1 failed (a file, the disk, memory); 2 the command line is wrong, by itself or\n"
    "for this file; 130 interrupted.\n"
    "Formats are found below the folder that KRVHOME names, else beside the library.";

constexpr unsigned int MOST_THREADS = 1024;

// Warnings that the library gave, each once. They are told at the end, except one that is the error itself.
std::vector<std::string>& Warnings()
{
    static std::vector<std::string> oWarnings;
    return oWarnings;
}

// Any thread warns; nobody reads before the work is done.
void NoteWarning(const std::string& message, const std::string&, unsigned int)
{
    static std::mutex oMutex;
    const std::lock_guard oLock(oMutex);
    auto& oWarnings = Warnings();
    if (!message.empty() && std::find(oWarnings.begin(), oWarnings.end(), message) == oWarnings.end())
        oWarnings.push_back(message);
}

void TellWarnings(const std::string& error)
{
    for (const std::string& warning : Warnings())
    {
        if (OneLine(warning) != error)
            std::fprintf(stderr, "krv: warning: %s\n", OneLine(warning).c_str());
    }
}

// An empty value is a slip, such as a variable of a script that was never set. No options at all are a choice.
void RefuseEmptyValues(CLI::App& oApp)
{
    for (CLI::App* const poVerb : oApp.get_subcommands({}))
    {
        for (CLI::Option* const poOption : poVerb->get_options())
        {
            if (poOption->get_items_expected_max() > 0 && !poOption->check_lname("options"))
                poOption->check([](const std::string& text)
                                { return std::string(text.empty() ? "the value is empty; give one" : ""); });
        }
    }
}

// The first word that is neither an option nor the value of one; empty when there is none.
std::string FindVerb(int nArguments, char** pArguments)
{
    for (int i = 1; i < nArguments; ++i)
    {
        const std::string word = pArguments[i];
        if (!word.starts_with('-'))
            return word;
        i += word == "--threads" ? 1 : 0;
    }
    return {};
}

std::vector<std::string> ListVerbs(const CLI::App& oApp)
{
    std::vector<std::string> oNames;
    for (const CLI::App* const poVerb : oApp.get_subcommands({}))
        if (!poVerb->get_group().empty())
            oNames.push_back(poVerb->get_name());
    return oNames;
}

// An unknown verb is told by itself: what follows it means nothing.
bool RefuseVerb(const CLI::App& oApp, const std::string& verb)
{
    const auto oKnown = oApp.get_subcommands([&](const CLI::App* poVerb) { return poVerb->check_name(verb); });
    if (verb.empty() || !oKnown.empty())
        return false;
    const std::vector<std::string> oVerbs = ListVerbs(oApp);
    const std::string nearest = FindNearestWord(verb, oVerbs);
    std::string all;
    for (const std::string& name : oVerbs)
        all += (all.empty() ? "" : ", ") + name;
    std::fprintf(stderr, "krv: there is no verb \"%s\"; %s\n", OneLine(verb).c_str(),
                 (nearest.empty() ? "the verbs are " + all : "is " + nearest + " meant?").c_str());
    return true;
}

// What the parser says of the command line, as a sentence for its user.
std::string DescribeMistake(const CLI::App* poApp, const CLI::Error& oError)
{
    std::string text = oError.what();
    const auto oUsed = poApp->get_subcommands();
    const CLI::App& oVerb = oUsed.empty() ? *poApp : *oUsed.front();
    const std::size_t nTwice = text.find(": At Most 1 required but received");
    const std::size_t nFew = text.find(": At least ");
    const std::size_t nUnknown = text.rfind(" --");
    if (nTwice != std::string::npos)
        text.replace(nTwice, std::string::npos, " is given more than once");
    else if (nFew != std::string::npos)
        text = "too few " + text.substr(0, nFew) + ": at least " + text.substr(nFew + std::strlen(": At least "));
    else if (dynamic_cast<const CLI::ExtrasError*>(&oError) != nullptr && nUnknown != std::string::npos)
    {
        std::vector<std::string> oNames;
        for (const CLI::App* const poOne : {&oVerb, poApp})
            for (const CLI::Option* const poOption : poOne->get_options())
                for (const std::string& name : poOption->get_lnames())
                    oNames.push_back("--" + name);
        const std::string word = text.substr(nUnknown + 1);
        const std::string nearest = FindNearestWord(word.substr(0, word.find('=')), oNames);
        text = "there is no option " + word + (nearest.empty() ? "" : "; is " + nearest + " meant?");
    }
    if (text == "A subcommand is required")
        text = "a verb is required";
    return "krv: " + OneLine(text) + (text.ends_with('?') ? " `krv " : "; `krv ") +
           (oUsed.empty() ? "" : oVerb.get_name() + " ") + "--help` explains\n";
}

int RunVerb(const Selection& oSelection)
{
    try
    {
        const int nCode = oSelection.run();
        TellWarnings("");
        return nCode;
    }
    catch (const UsageError&)
    {
        std::fprintf(stderr, "krv: %s\n", DescribeError("", oSelection.verbose).c_str());
        return 2;
    }
    catch (const operations::StoppedException&)
    {
        TellWarnings("");
        std::fprintf(stderr, "krv: interrupted; files are as they were\n");
        return INTERRUPTED;
    }
    catch (...)
    {
        TellWarnings(CurrentMessage());
        std::fprintf(stderr, "krv: %s\n", DescribeError(oSelection.file, oSelection.verbose).c_str());
        return 1;
    }
}

} // namespace

int RunApplication(int nArguments, char** pArguments)
{
    CLI::App oApp("Reads and writes raster files of every format that has a plug-in.", "krv");
    oApp.formatter(std::make_shared<HelpFormatter>());
    oApp.set_help_flag("-h,--help", "Show this help");
    Selection oSelection;
    unsigned int nThreads = 0;
    oApp.set_version_flag("--version", "krv " KRV_VERSION, "Show the version");
    oApp.add_flag("--verbose", oSelection.verbose, "Errors also name the function, source file and line");
    oApp.add_option("--threads", nThreads, "How many threads work at a time; by default one for each processor")
        ->check(CLI::Range(1U, MOST_THREADS));
    oApp.failure_message(&DescribeMistake);
    oApp.require_subcommand(1);
    oApp.fallthrough();
    AddFormatsVerb(oApp, oSelection);
    AddInfoVerb(oApp, oSelection);
    AddChecksumVerb(oApp, oSelection);
    AddStatsVerb(oApp, oSelection);
    AddViewVerb(oApp, oSelection);
    AddWalkVerb(oApp, oSelection);
    AddConvertVerb(oApp, oSelection);
    AddLinkVerb(oApp, oSelection);
    AddOverviewsVerb(oApp, oSelection);
    AddMaskVerb(oApp, oSelection);
    AddWarpVerb(oApp, oSelection);
    AddEditVerb(oApp, oSelection);
    AddSampleVerb(oApp, oSelection);
    AddDoctorVerb(oApp, oSelection);
    AddDescribeVerb(oApp, oSelection);
    for (CLI::App* const poVerb :
         oApp.get_subcommands([](const CLI::App* poOne) { return !poOne->get_group().empty(); }))
        poVerb->group("Verbs");
    RefuseEmptyValues(oApp);
    oApp.footer(FOOTER); // after the verbs, which would take it over
    if (RefuseVerb(oApp, FindVerb(nArguments, pArguments)))
        return 2;
    try
    {
        oApp.parse(nArguments, pArguments);
    }
    catch (const CLI::ParseError& oError)
    {
        return oApp.exit(oError) == 0 ? 0 : 2;
    }
    krv::nspio::Warning::SetSink(&NoteWarning);
    WatchForInterrupt();
    SetThreadCount(nThreads);
    return RunVerb(oSelection);
}

} // namespace krv::tool
