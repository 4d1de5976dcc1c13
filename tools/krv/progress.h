#pragma once

#include "operations/job/progress.h"

#include <chrono>
#include <cstdint>
#include <string>

namespace krv::tool
{

// A bar with bytes, rate and time left on the standard error output, drawn only when that is a terminal and not before
// half a second has passed. The line is cleared at the end.
class ProgressBar
{
public:
    ProgressBar(std::string label, std::uint64_t nTotalBytes);
    ProgressBar(const ProgressBar&) = delete;
    ProgressBar& operator=(const ProgressBar&) = delete;
    ~ProgressBar();

    void Show(std::uint64_t nDone);

private:
    using Clock = std::chrono::steady_clock;

    void Draw(Clock::time_point oNow, std::uint64_t nDone);

    std::string moLabel;
    std::uint64_t mnTotal;
    bool mbTerminal;
    bool mbDrawn = false;
    Clock::time_point moStart;
    Clock::time_point moNextDraw;
};

// For a job: draws a bar for each of its parts, and stops it when the user asked for that.
operations::Progress ShowProgress();

// The bar's text without the control characters: at most 79 columns.
std::string ProgressLine(const std::string& label, std::uint64_t nDone, std::uint64_t nTotal, double nSeconds);

// "0 B", "1.5 KiB", "12.3 MiB"
std::string BytesText(double nBytes);

} // namespace krv::tool
