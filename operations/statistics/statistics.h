#pragma once

#include "gobs/raster/datatype.h"
#include "operations/api.h"
#include "operations/job/progress.h"
#include "operations/source/sourcefile.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <variant>
#include <vector>

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

// Signed integers, unsigned ones and reals, by the channel's type.
using ExactNumber = std::variant<std::int64_t, std::uint64_t, double>;

// What a channel's values are like. A value counts once: as no-data, as masked (its pixel is not valid by something
// else: the validity mask, alpha, the no-data of all other channels), as not a number, as infinite, or as valid; only
// valid ones take part in the rest. Without a valid value there is no rest. Extremes are numbers of the channel's own
// type, 64-bit integers exact; the standard deviation is that of the population. Complex channels: of the magnitude.
struct ChannelStatistics
{
    unsigned int number = 0; // of the channel, from 1; 0 when they are of no file
    krv::gobs::DataType type;
    std::string noDataText;        // as the file has it; empty when it has none
    bool alpha = false;            // it says which pixels are valid and has no statistics of its own
    std::uint64_t valid = 0;       // with noData, masked, nan and infinite all values of the channel
    std::uint64_t noData = 0;      // equal to the no-data value
    std::uint64_t masked = 0;      // not valid by mask, alpha or the other channels
    std::uint64_t transparent = 0; // those of the masked ones that alpha leaves out
    std::uint64_t nan = 0;         // of reals; 0 for integers
    std::uint64_t infinite = 0;    // of reals
    std::optional<ExactNumber> minimum;
    std::optional<ExactNumber> maximum;

    // Of complex channels: of the magnitudes.
    std::optional<double> mean;
    std::optional<double> deviation; // 0 for a single value
    // On request. Bins of equal width from low to high; those of integers begin half a step below the minimum and end
    // half a step above the maximum.
    std::vector<std::uint64_t> histogram;
    double histogramLow = 0; // a value of the channel, scaled when that was asked for
    double histogramHigh = 0;
    // On request, one value for each share: the smallest value that so many hundredths of the valid values do not
    // exceed. Exact for integers whose extremes are less than 65536 apart, else to a 65536th of that distance.
    std::vector<double> percentiles;
};

// The bins in which values are counted: value v falls into bin (v - low) * perValue, cut off.
// Values below the first bin and above the last count there.
struct HistogramBins
{
    double low = 0;      // where the first bin begins
    double perValue = 1; // bins for one step of the value
    std::size_t count = 0;
};

// Gathers the statistics of one channel. Exact sums for integers; for reals each run of some thousand values is summed
// around its own mean and the runs are merged in extended precision, so that a large offset costs no digits.
// For programs that have pixels without a file. Memory does not grow with the number of values.
class KRV_OPERATIONS_API StatisticsGatherer
{
public:
    virtual ~StatisticsGatherer();

    // Values of one channel, the first at pFirst, nStride values apart. pValid: a bit per pixel, the highest of a byte
    // first, or null when all are valid.
    // pOpaque: the same for pixels that alpha leaves in; null when all are.
    virtual void Add(const unsigned char* pFirst, std::uint64_t nPixels, unsigned int nStride,
                     const unsigned char* pValid = nullptr, const unsigned char* pOpaque = nullptr) = 0;
    // From now on valid values are counted by their size too, in ChannelStatistics::histogram.
    virtual void CountInto(const HistogramBins& oBins) = 0;
    // Of all values so far; more may be added afterwards. Number and no-data text are left to the caller.
    virtual ChannelStatistics Get() const = 0;
    // Adds what another one, of the same type, has gathered. The result depends on the order, in the last digits of
    // reals alone.
    virtual void Merge(const StatisticsGatherer& oOther) = 0;

    // Throws DataException for a type outside the table.
    // oNoData: nothing where no value is no-data.
    static std::unique_ptr<StatisticsGatherer> Make(const krv::gobs::DataType& oType, const OptionalNoData& oNoData);
};

// Example: {.channels = {1}, .percentiles = {2, 98}}.
struct StatisticsRequest
{
    std::vector<unsigned int> channels; // empty: all
    bool raw = false;                   // pixels that the validity mask or alpha leaves out count too
    bool power = false;                 // of a radar scene's power, one result whose number is 0
    std::size_t bins = 0;               // of a histogram; 0: none. The file is read a second time for it
    std::vector<double> percentiles;    // 0 to 100; read a second time for them too
    bool unscale = false;               // numbers are those that the values stand for (SourceFile::GetScale)
};

// One result for each channel that is asked for, in that order. Throws RequestException for a channel that is not
// there. The results are the same for any number of threads.
// poExecutor: whose threads decode and count; borrowed, null for none.
KRV_OPERATIONS_API std::vector<ChannelStatistics> ComputeStatistics(const SourceFile& oFile,
                                                                    const StatisticsRequest& oRequest,
                                                                    const Progress& oProgress = {},
                                                                    krv::threading::IExecutor* poExecutor = nullptr);

} // namespace krv::operations
