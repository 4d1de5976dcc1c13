#include "tools/krv/progress.h"

#include "tools/krv/interrupt.h"

#include <fmt/format.h>

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <memory>
#include <optional>

namespace krv::tool
{

namespace
{

constexpr auto FIRST_DRAW = std::chrono::milliseconds(500);
constexpr auto DRAW_INTERVAL = std::chrono::milliseconds(100);

std::string TimeText(double nSeconds)
{
    const auto n = static_cast<unsigned long long>(std::clamp(nSeconds, 0.0, 3.6e8));
    return n >= 3600 ? fmt::format("{}:{:02}:{:02}", n / 3600, n / 60 % 60, n % 60)
                     : fmt::format("{}:{:02}", n / 60, n % 60);
}

} // namespace

std::string BytesText(double nBytes)
{
    constexpr const char* UNITS[] = {"B", "KiB", "MiB", "GiB", "TiB"};
    unsigned int nUnit = 0;
    for (; nBytes >= 1024.0 && nUnit < 4; ++nUnit)
        nBytes /= 1024.0;
    return nUnit == 0 ? fmt::format("{:.0f} B", nBytes) : fmt::format("{:.1f} {}", nBytes, UNITS[nUnit]);
}

std::string ProgressLine(const std::string& label, std::uint64_t nDone, std::uint64_t nTotal, double nSeconds)
{
    constexpr unsigned int WIDTH = 20;
    const double nShare = nTotal == 0 ? 1.0 : std::min(static_cast<double>(nDone) / static_cast<double>(nTotal), 1.0);
    const double nRate = nSeconds > 0 ? static_cast<double>(nDone) / nSeconds : 0.0;
    const auto nFilled = static_cast<unsigned int>(nShare * WIDTH);
    const std::string left =
        nShare > 0 ? TimeText(nSeconds * (1.0 - nShare) / nShare) + " left" : std::string("starting");
    return fmt::format("{:.12} [{}{}] {:3.0f} %  {}  {}/s  {}", label, std::string(nFilled, '#'),
                       std::string(WIDTH - nFilled, '.'), 100 * nShare, BytesText(static_cast<double>(nDone)),
                       BytesText(nRate), left)
        .substr(0, 79);
}

ProgressBar::ProgressBar(std::string label, std::uint64_t nTotalBytes)
    : moLabel(std::move(label)), mnTotal(nTotalBytes), mbTerminal(isatty(STDERR_FILENO) == 1), moStart(Clock::now()),
      moNextDraw(moStart + FIRST_DRAW)
{
}

ProgressBar::~ProgressBar()
{
    if (mbDrawn)
        std::fputs("\r\033[K", stderr);
}

void ProgressBar::Show(std::uint64_t nDone)
{
    if (!mbTerminal)
        return;
    const auto oNow = Clock::now();
    if (oNow >= moNextDraw)
        Draw(oNow, nDone);
}

void ProgressBar::Draw(Clock::time_point oNow, std::uint64_t nDone)
{
    moNextDraw = oNow + DRAW_INTERVAL;
    mbDrawn = true;
    const double nSeconds = std::chrono::duration<double>(oNow - moStart).count();
    std::fprintf(stderr, "\r%s\033[K", ProgressLine(moLabel, nDone, mnTotal, nSeconds).c_str());
    std::fflush(stderr);
}

operations::Progress ShowProgress()
{
    const auto poBar = std::make_shared<std::optional<ProgressBar>>();
    return [poBar](const operations::Amount& oAmount)
    {
        if (WasInterrupted())
            return false;
        if (oAmount.done == 0 || !*poBar)
            poBar->emplace(oAmount.part, oAmount.total);
        (*poBar)->Show(oAmount.done);
        if (oAmount.done >= oAmount.total)
            poBar->reset();
        return true;
    };
}

} // namespace krv::tool
