#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::tool
{

class Progress;

// CRC-32 (the polynomial of zlib) of each channel of the reader over its pixels in row-major order, little-endian,
// without margins. Reads each tile once; the reader's tile size changes. Memory: the pixels of a row of tiles, at most
// MAX_BAND_BYTES whatever the size of the image.
std::vector<std::uint32_t> ComputeChecksums(krv::datasources::IRasterReader& oReader, Progress& oProgress);

constexpr std::uint64_t MAX_BAND_BYTES = 128ULL << 20U;

} // namespace krv::tool
