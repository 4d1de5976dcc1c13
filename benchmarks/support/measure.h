#pragma once

#include <functional>
#include <string>
#include <vector>

// What the benchmarks share: interleaved rounds, medians, one table of ratios.
namespace krv::benchmarks
{

// The wall time of one run, and the middle one of several values.
double Seconds(const std::function<void()>& oRun);
double Median(std::vector<double> oValues);

struct Candidate
{
    std::string moName;
    std::function<void()> moRun;
};

// Those of the processor are told from where the machine has other work; of all threads together.
enum class Times
{
    eWall,
    eProcessor
};

// Runs every candidate once unmeasured, then nRounds times in turn with the order changed every round, and returns the
// median seconds of each.
std::vector<double> MedianSeconds(const std::vector<Candidate>& oCandidates, int nRounds, Times eTimes = Times::eWall);

// One row of the table: what was measured, the ratio, the goal (0: none) and remarks.
void PrintRow(const std::string& workload, double nRatio, double nGoal, const std::string& remarks = {});
void PrintHeading(const std::string& title);

// "1.23" with nDigits behind the point.
std::string Number(double nValue, int nDigits = 2);

// Keeps the compiler from dropping what nobody reads.
void Keep(const void* pData);

} // namespace krv::benchmarks
