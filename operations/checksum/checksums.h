#pragma once

#include "gobs/raster/datatype.h"
#include "operations/api.h"
#include "operations/job/progress.h"

#include <cstdint>
#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

class SourceFile;

// Equal sums and types mean equal pixels, whatever format, codec or blocks the file has.
struct ChannelChecksum
{
    unsigned int number = 0;  // of the channel, from 1
    krv::gobs::DataType type; // of the values that were summed
    std::uint32_t crc32 = 0;  // as eight hexadecimal digits in texts
};

// Width and height are those of the level that was asked for.
struct Checksums
{
    unsigned int width = 0;
    unsigned int height = 0;
    std::vector<ChannelChecksum> channels; // in the order in which they were asked for
};

// CRC-32 (the polynomial of zlib) of each channel over its pixels in row-major order, little-endian, without margins,
// of the image or of one of its levels. No channels: all. Throws RequestException for a channel or a level that is not
// there. Reads each tile once; the sums are the same whatever reads how many at a time.
// Channels count from 1. poExecutor: whose threads decode; borrowed, null for none.
KRV_OPERATIONS_API Checksums ComputeChecksums(const SourceFile& oFile, const std::vector<unsigned int>& oChannels,
                                              unsigned int nLevel = 1, const Progress& oProgress = {},
                                              krv::threading::IExecutor* poExecutor = nullptr);

// The same of each channel of a reader, whose tile size changes when its tiles are larger than MAX_TILE_BYTES.
// One sum for each channel of its rasters. The reader stays the caller's.
KRV_OPERATIONS_API std::vector<std::uint32_t> ComputeChecksums(krv::datasources::IRasterReader& oReader,
                                                               const Progress& oProgress = {});

// 64 MiB of one tile of all channels.
constexpr std::uint64_t MAX_TILE_BYTES = 64ULL << 20U;

} // namespace krv::operations
