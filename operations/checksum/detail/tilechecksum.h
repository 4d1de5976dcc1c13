#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace krv::datasources
{
class IRasterReader;
}

namespace krv::gobs
{
class Raster;
}

namespace krv::operations::detail
{

// What a tile adds to the CRC-32 of each channel over all pixels in row-major order. The sum of a row of bytes that is
// followed by n others is its own CRC times x to the power of 8n, and sums of parts add up by exclusive or: so tiles
// may come in any order, and nothing is kept of them.
class TileChecksum
{
public:
    explicit TileChecksum(const krv::datasources::IRasterReader& oReader);

    // One per channel of the reader, whose tile it is, without margins. oScratch: memory that a thread keeps.
    std::vector<std::uint32_t> Compute(const krv::gobs::Raster& oTile, std::vector<unsigned char>& oScratch) const;

private:
    // Adds rows of a plane to the sum of those above.
    std::uint32_t AddRows(std::uint32_t nSum, const unsigned char* pRows, std::size_t nRowBytes,
                          std::size_t nRows) const;
    std::uint32_t ShiftRow(std::uint32_t nSum) const;

    std::uint64_t mnWidth;
    std::uint64_t mnHeight;
    std::size_t mnValueBytes;
    // A CRC times x to the power of the bits of a row of the image, by its four bytes.
    std::array<std::array<std::uint32_t, 256>, 4> moRowShift;
};

} // namespace krv::operations::detail
