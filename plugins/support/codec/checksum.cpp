#include "plugins/support/codec/checksum.h"

#include <isa-l/crc.h>

namespace krv::plugins::codec
{

std::uint32_t Checksum(std::uint32_t nBefore, const void* pBytes, std::size_t nBytes)
{
    return crc32_gzip_refl(nBefore, static_cast<const unsigned char*>(pBytes), nBytes);
}

std::uint32_t Checksum(const unsigned char* pRows, std::size_t nPitch, std::size_t nRowBytes, std::size_t nRows)
{
    if (nPitch == nRowBytes)
        return Checksum(0, pRows, nRowBytes * nRows);
    std::uint32_t nChecksum = 0;
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        nChecksum = Checksum(nChecksum, pRows + nRow * nPitch, nRowBytes);
    return nChecksum;
}

} // namespace krv::plugins::codec
