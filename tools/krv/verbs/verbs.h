#pragma once

#include "operations/source/mapwindow.h"

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace CLI
{
class App;
class Option;
} // namespace CLI

namespace krv::tool
{

// What the arguments selected. Verbs fill it while they are parsed; Run does the work and returns the exit code.
struct Selection
{
    std::function<int()> run;
    std::string file;     // the file that errors without a file name are about
    bool verbose = false; // errors name the place of the throw
};

// Does the work for each file. One of several that fails is told on the standard error output, and the others are done
// all the same; the failure of a single one passes, and so does an interruption. Returns the exit code, that of the
// first failure.
int ForEachFile(Selection& oSelection, const std::vector<std::string>& oNames,
                const std::function<void(const std::string& file)>& oWork);

// Each adds one verb to the command: its help, its options and what it does.
void AddFormatsVerb(CLI::App& oApp, Selection& oSelection);
void AddInfoVerb(CLI::App& oApp, Selection& oSelection);
void AddChecksumVerb(CLI::App& oApp, Selection& oSelection);
void AddStatsVerb(CLI::App& oApp, Selection& oSelection);
void AddViewVerb(CLI::App& oApp, Selection& oSelection);
void AddWalkVerb(CLI::App& oApp, Selection& oSelection);
void AddConvertVerb(CLI::App& oApp, Selection& oSelection);
void AddLinkVerb(CLI::App& oApp, Selection& oSelection);
void AddOverviewsVerb(CLI::App& oApp, Selection& oSelection);
void AddMaskVerb(CLI::App& oApp, Selection& oSelection);
void AddEditVerb(CLI::App& oApp, Selection& oSelection);
void AddSampleVerb(CLI::App& oApp, Selection& oSelection);
void AddWarpVerb(CLI::App& oApp, Selection& oSelection);
void AddDoctorVerb(CLI::App& oApp, Selection& oSelection);
void AddDescribeVerb(CLI::App& oApp, Selection& oSelection);

// "1,2,5-7" as numbers; an empty text is an empty list. Throws UsageError naming the option.
std::vector<unsigned int> ParseNumbers(const std::string& text, const std::string& option);

// "1.5,-2e3" as so many numbers; an empty text is an empty list. Throws UsageError naming the option.
std::vector<double> ParseReals(const std::string& text, const std::string& option, std::size_t nLeast,
                               std::size_t nMost);

// Nothing for an option that was not given.
inline std::optional<std::string> GivenOrNone(const std::string& text)
{
    return text.empty() ? std::nullopt : std::optional(text);
}

// Adds an option that takes one of some words, in any letter case. oTake: gets the place of the word in the list.
CLI::Option* AddWords(CLI::App& oVerb, const std::string& name, const std::string& what,
                      const std::vector<std::string>& oWords, const std::function<void(std::size_t)>& oTake);

// The same for the word itself, in the letters of the list.
inline CLI::Option* AddWord(CLI::App& oVerb, const std::string& name, std::string& oTarget, const std::string& what,
                            const std::vector<std::string>& oWords)
{
    return AddWords(oVerb, name, what, oWords, [&oTarget, oWords](std::size_t nWord) { oTarget = oWords[nWord]; });
}

// The same for values that the words stand for.
template <class Value>
CLI::Option* AddChoice(CLI::App& oVerb, const std::string& name, Value& oTarget, const std::string& what,
                       const std::vector<std::pair<std::string, Value>>& oChoices)
{
    std::vector<std::string> oWords;
    for (const auto& oChoice : oChoices)
        oWords.push_back(oChoice.first);
    return AddWords(oVerb, name, what, oWords,
                    [&oTarget, oChoices](std::size_t nWord) { oTarget = oChoices[nWord].second; });
}

// A part of the image as users name it: in pixels, in map coordinates, or where another file lies.
struct WindowOptions
{
    std::string window;
    std::string bounds;
    std::string like;
};

// Adds --bounds and --like, and the option for pixels under its name.
void AddWindowOptions(CLI::App& oVerb, WindowOptions& oOptions, const std::string& name, const std::string& what);
// Throws UsageError for texts that are no windows.
krv::operations::WindowRequest ParseWindow(const WindowOptions& oOptions, const std::string& name);

} // namespace krv::tool
