#pragma once

#include "toolkit/api.h"
#include "toolkit/raster/copydata.h"

#include <cstdint>
#include <memory>
#include <vector>

namespace krv::raster
{

// A pixel-interleaved buffer without padding that a Splitter makes, and the channels of the source, from 0, that it
// takes, in its order.
// Repeats and any order of channels are allowed.
struct SplitTarget
{
    BufferType meType = eBT_8U;
    std::vector<unsigned int> moChannels;
};

// Makes several pixel-interleaved buffers of the channels of one, each of a type of its own, converted by the rules of
// CopyData: the counterpart of Merger. The source is read once, a block at a time that stays in the nearest caches.
// What depends on the types and places alone is worked out once, by the constructor. One thread at a time.
// Example: RGB and infrared of 16 bits apart: Splitter(eBT_16U, 4, {{eBT_8U, {0, 1, 2}}, {eBT_16U, {3}}}).
class KRV_TOOLKIT_API Splitter
{
public:
    // Throws ParameterException for an unknown type, DataException for a channel that does not exist and for pixels of
    // more than 2^31 - 1 bytes.
    Splitter(BufferType eSource, unsigned int nSourceChannels, const std::vector<SplitTarget>& oTargets);
    ~Splitter();
    Splitter(const Splitter&) = delete;
    Splitter& operator=(const Splitter&) = delete;

    // pSource: nPixels pixels of all channels; oTargets: a buffer of nPixels pixels for each target, in their order,
    // every byte of which is written. Nothing need be aligned; buffers do not overlap.
    // pChanged: null, or one number for each channel of each target, in their order, to which that of the values is
    // added that are not what they were: rounded, saturated, NaN made 0, or complex with an imaginary part that is
    // dropped. Types that hold every value of the source's cost nothing to count.
    // Throws nothing but std::bad_alloc.
    void Run(const unsigned char* pSource, const std::vector<unsigned char*>& oTargets, std::uint64_t nPixels,
             std::uint64_t* pChanged = nullptr);

private:
    class Part;

    std::vector<std::unique_ptr<Part>> moParts; // one for each target
    std::uint64_t mnSourceBytes = 0;            // of a pixel
    std::uint64_t mnBlockPixels = 0;
};

} // namespace krv::raster
