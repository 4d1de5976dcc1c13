#pragma once

#include "gobs/raster/datatype.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/pixeltypes.h"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::gobs
{
class IMaskBuilder;
}

namespace krv::tool
{

class Progress;

// What a channel's values are like. A value counts once: as no-data, as masked (its pixel is not valid by something
// else: the validity mask, alpha, the no-data of all other channels), as not a number, as infinite, or as valid; only
// valid ones take part in the rest. Without a valid value the rest is null. Extremes are numbers of the channel's own
// type, 64-bit integers exact; the standard deviation is that of the population. Complex channels: of the magnitude.
struct ChannelStatistics
{
    std::uint64_t valid = 0;
    std::uint64_t noData = 0;
    std::uint64_t masked = 0;
    std::uint64_t nan = 0;
    std::uint64_t infinite = 0;
    Json minimum;
    Json maximum;
    Json mean;
    Json deviation;
};

// Gathers the statistics of one channel. Exact sums for integers; for reals each run of some thousand values is summed
// around its own mean and the runs are merged in extended precision, so that a large offset costs no digits.
class StatisticsGatherer
{
public:
    virtual ~StatisticsGatherer() = default;

    // Values of one channel, the first at pFirst, nStride values apart. pValid: a bit per pixel, the highest of a byte
    // first, or null when all are valid.
    virtual void Add(const unsigned char* pFirst, std::uint64_t nPixels, unsigned int nStride,
                     const unsigned char* pValid = nullptr) = 0;
    virtual ChannelStatistics Get() const = 0;

    // Throws DataException for a type outside the table.
    static std::unique_ptr<StatisticsGatherer> Make(const krv::gobs::DataType& oType, const OptionalNoData& oNoData);
};

// One result per channel of the reader. oNoData: one per channel. pValidity: set bits are valid pixels; null: all are.
std::vector<ChannelStatistics> ComputeStatistics(krv::datasources::IRasterReader& oReader,
                                                 const std::vector<OptionalNoData>& oNoData,
                                                 const krv::gobs::IMaskBuilder* pValidity, Progress& oProgress);

} // namespace krv::tool
