#include "benchmarks/support/measure.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <ctime>
#include <numeric>
#include <random>

namespace krv::benchmarks
{

double Seconds(const std::function<void()>& oRun)
{
    const auto oStart = std::chrono::steady_clock::now();
    oRun();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - oStart).count();
}

double Median(std::vector<double> oValues)
{
    std::sort(oValues.begin(), oValues.end());
    return oValues[oValues.size() / 2];
}

std::vector<double> MedianSeconds(const std::vector<Candidate>& oCandidates, int nRounds, Times eTimes)
{
    std::vector<std::size_t> oOrder(oCandidates.size());
    std::iota(oOrder.begin(), oOrder.end(), std::size_t{0});
    std::mt19937 oRandom(7);
    for (const Candidate& oCandidate : oCandidates)
        oCandidate.moRun();
    std::vector<std::vector<double>> oTimes(oCandidates.size());
    for (int nRound = 0; nRound < nRounds; ++nRound)
    {
        std::shuffle(oOrder.begin(), oOrder.end(), oRandom);
        for (const std::size_t nIndex : oOrder)
        {
            const std::clock_t nBegin = std::clock();
            const double nWall = Seconds(oCandidates[nIndex].moRun);
            const double nProcessor = static_cast<double>(std::clock() - nBegin) / CLOCKS_PER_SEC;
            oTimes[nIndex].push_back(eTimes == Times::eWall ? nWall : nProcessor);
        }
    }
    std::vector<double> oMedians;
    for (const auto& oValues : oTimes)
        oMedians.push_back(Median(oValues));
    return oMedians;
}

void PrintHeading(const std::string& title)
{
    std::printf("\n%s\n%-52s %7s %7s   %s\n", title.c_str(), "workload", "ratio", "goal", "");
}

void PrintRow(const std::string& workload, double nRatio, double nGoal, const std::string& remarks)
{
    const std::string goal = nGoal > 0 ? Number(nGoal) : "-";
    std::printf("%-52s %7.2f %7s   %s\n", workload.c_str(), nRatio, goal.c_str(), remarks.c_str());
    std::fflush(stdout);
}

std::string Number(double nValue, int nDigits)
{
    char oText[32];
    std::snprintf(oText, sizeof oText, "%.*f", nDigits, nValue);
    return oText;
}

void Keep(const void* pData)
{
    asm volatile("" : : "r"(pData) : "memory");
}

} // namespace krv::benchmarks
