#pragma once

#include "toolkit/api.h"
#include "toolkit/raster/copydata.h"

#include <cstdint>
#include <memory>
#include <vector>

namespace krv::raster
{

// A pixel-interleaved buffer without padding, from which a Merger takes channels.
// Buffers come with each Run; only their form is fixed beforehand.
struct MergeSource
{
    BufferType meType = eBT_8U;
    unsigned int mnChannels = 0; // of a pixel of the source
};

// Where a channel of the result comes from; both count from 0.
// {n, c}: channel c of the n-th source.
struct MergeChannel
{
    static constexpr unsigned int NOWHERE = ~0u; // as a source: the channel is 0

    unsigned int mnSource = NOWHERE;
    unsigned int mnChannel = 0; // of the source
};

// Makes one pixel-interleaved buffer of the channels of several, converted by the rules of CopyData, in one pass over
// the result. What depends on the types and places alone is worked out once, by the constructor. One thread at a time.
// Example: three files of one band each become an RGB buffer: sources {8U, 1} three times, channels {0, 0}, {1, 0}, {2,
// 0}.
class KRV_TOOLKIT_API Merger
{
public:
    // Throws ParameterException for an unknown type, DataException for a place that does not exist and for pixels of
    // more than 2^31 - 1 bytes.
    Merger(const std::vector<MergeSource>& oSources, BufferType eTarget, const std::vector<MergeChannel>& oChannels);
    ~Merger();
    Merger(const Merger&) = delete;
    Merger& operator=(const Merger&) = delete;

    // Whether Run counts: the sources are of one type, whose values may change on their way to that of the result, and
    // this processor converts them as it stores them.
    // Always known before the first Run, so that a caller may count by itself otherwise.
    bool CountsChanges() const;

    // pSources: a buffer of nPixels pixels for each source, in their order; pTarget: nPixels pixels of all channels,
    // every byte of which is written. Nothing need be aligned; buffers do not overlap. Returns how many of its values,
    // of complex ones parts, are not what they were, NaN aside that is still NaN; 0 when it does not count.
    // oSources: as many pointers as the constructor got sources; none is kept.
    std::uint64_t Run(const std::vector<const unsigned char*>& oSources, unsigned char* pTarget, std::uint64_t nPixels);

private:
    class Plan;

    std::unique_ptr<Plan> mpoPlan;
};

} // namespace krv::raster
