#include "operations/checksum/detail/tilechecksum.h"

#include "datasources/reader/irasterreader.h"
#include "gobs/raster/raster.h"
#include "toolkit/raster/interleave.h"

#include <libdeflate.h>
#include <zlib.h>

#include <algorithm>
#include <bit>

static_assert(std::endian::native == std::endian::little, "checksums are over little-endian values");
static_assert(sizeof(z_off_t) == 8, "lengths have 64 bits");

namespace krv::operations::detail
{

namespace
{

// Rows of pixels and a plane of them stay in a cache near by.
constexpr std::size_t PIECE_BYTES = 65536;

std::uint32_t Shift(std::uint32_t nSum, std::uint64_t nBytes)
{
    return static_cast<std::uint32_t>(crc32_combine(nSum, 0, static_cast<z_off_t>(nBytes)));
}

} // namespace

TileChecksum::TileChecksum(const krv::datasources::IRasterReader& oReader)
    : mnWidth(oReader.GetWidth()), mnHeight(oReader.GetHeight()), mnValueBytes(oReader.GetDataType().GetValueBits() / 8)
{
    // The shift is linear: what it makes of each bit gives all the rest.
    const auto nOperator = crc32_combine_gen(static_cast<z_off_t>(mnWidth * mnValueBytes));
    for (unsigned int nByte = 0; nByte < 4; ++nByte)
    {
        moRowShift[nByte][0] = 0;
        for (unsigned int nBit = 0; nBit < 8; ++nBit)
        {
            const auto nShifted = static_cast<std::uint32_t>(crc32_combine_op(1UL << (8 * nByte + nBit), 0, nOperator));
            for (unsigned int n = 0; n < 1U << nBit; ++n)
                moRowShift[nByte][(1U << nBit) + n] = moRowShift[nByte][n] ^ nShifted;
        }
    }
}

std::uint32_t TileChecksum::ShiftRow(std::uint32_t nSum) const
{
    return moRowShift[0][nSum & 255] ^ moRowShift[1][nSum >> 8 & 255] ^ moRowShift[2][nSum >> 16 & 255] ^
           moRowShift[3][nSum >> 24];
}

std::uint32_t TileChecksum::AddRows(std::uint32_t nSum, const unsigned char* pRows, std::size_t nRowBytes,
                                    std::size_t nRows) const
{
    // Rows of the whole image follow each other.
    if (nRowBytes == mnWidth * mnValueBytes)
        return libdeflate_crc32(nSum, pRows, nRowBytes * nRows);
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        nSum = ShiftRow(nSum) ^ libdeflate_crc32(0, pRows + nRow * nRowBytes, nRowBytes);
    return nSum;
}

std::vector<std::uint32_t> TileChecksum::Compute(const krv::gobs::Raster& oTile,
                                                 std::vector<unsigned char>& oScratch) const
{
    const std::size_t nChannels = oTile.GetChansCount(), nWidth = oTile.GetWidth(), nHeight = oTile.GetHeight();
    const std::size_t nRowBytes = nWidth * mnValueBytes, nPitch = nRowBytes * nChannels;
    const std::size_t nMost = nChannels == 1 ? nHeight : std::max<std::size_t>(PIECE_BYTES / nPitch, 1);
    std::vector<std::uint32_t> oSums(nChannels, 0);
    if (nChannels > 1)
        oScratch.resize(std::max(oScratch.size(), nRowBytes * std::min(nMost, nHeight)));
    for (std::size_t nRow = 0; nRow < nHeight; nRow += nMost)
    {
        const std::size_t nRows = std::min(nMost, nHeight - nRow);
        const unsigned char* const pPixels = oTile.GetBuffer() + nRow * nPitch;
        for (std::size_t c = 0; c < nChannels; ++c)
        {
            if (nChannels > 1)
                raster::ExtractChannel(pPixels, nRows * nPitch, c, nChannels, oScratch.data(), nRows * nRowBytes,
                                       {nRows * nWidth, 1, mnValueBytes}); // rows without gaps are a long one
            oSums[c] = AddRows(oSums[c], nChannels > 1 ? oScratch.data() : pPixels, nRowBytes, nRows);
        }
    }
    const std::uint64_t nRight = static_cast<std::uint64_t>(oTile.GetX()) + nWidth;
    const std::uint64_t nBottom = static_cast<std::uint64_t>(oTile.GetY()) + nHeight;
    const std::uint64_t nFollowing = ((mnHeight - nBottom) * mnWidth + (mnWidth - nRight)) * mnValueBytes;
    for (std::uint32_t& nSum : oSums)
        nSum = Shift(nSum, nFollowing);
    return oSums;
}

} // namespace krv::operations::detail
