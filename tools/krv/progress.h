#pragma once

#include <chrono>
#include <cstdint>
#include <string>

namespace krv::tool
{

// How far a long job is: a bar with bytes, rate and time left on the standard error output, drawn only when that is a
// terminal and not before half a second has passed. The line is cleared at the end.
class Progress
{
public:
    Progress(std::string label, std::uint64_t nTotalBytes);
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;
    ~Progress();

    // Throws Stopped when the user asked for it.
    void Advance(std::uint64_t nBytes);

    std::uint64_t GetDone() const { return mnDone; }

private:
    using Clock = std::chrono::steady_clock;

    void Draw(Clock::time_point oNow);

    std::string moLabel;
    std::uint64_t mnTotal;
    std::uint64_t mnDone = 0;
    bool mbTerminal;
    bool mbDrawn = false;
    Clock::time_point moStart;
    Clock::time_point moNextDraw;
};

// The bar's text without the control characters: at most 79 columns.
std::string ProgressLine(const std::string& label, std::uint64_t nDone, std::uint64_t nTotal, double nSeconds);

// "0 B", "1.5 KiB", "12.3 MiB"
std::string BytesText(double nBytes);

} // namespace krv::tool
