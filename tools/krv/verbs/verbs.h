#pragma once

#include "operations/source/mapwindow.h"

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace CLI
{
class App;
}

namespace krv::tool
{

// What the arguments selected. Verbs fill it while they are parsed; Run does the work and returns the exit code.
struct Selection
{
    std::function<int()> run;
    std::string file; // the file that errors without a file name are about
};

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
void AddWarpVerb(CLI::App& oApp, Selection& oSelection);
void AddDoctorVerb(CLI::App& oApp, Selection& oSelection);

// "1,2,5" as numbers; an empty text is an empty list. Throws UsageError naming the option.
std::vector<unsigned int> ParseNumbers(const std::string& text, const std::string& option);

// "1.5,-2e3" as so many numbers; an empty text is an empty list. Throws UsageError naming the option.
std::vector<double> ParseReals(const std::string& text, const std::string& option, std::size_t nLeast,
                               std::size_t nMost);

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
