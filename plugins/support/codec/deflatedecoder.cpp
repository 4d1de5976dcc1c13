#include "plugins/support/codec/deflatedecoder.h"

#include <libdeflate.h>
#include <zlib.h>

#include <algorithm>
#include <array>
#include <limits>

namespace krv::plugins::codec
{

namespace
{

// zlib counts in 32 bits: takes at most that much of what is left.
unsigned int TakePart(std::size_t& nLeft)
{
    const auto nPart =
        static_cast<unsigned int>(std::min<std::size_t>(nLeft, std::numeric_limits<unsigned int>::max()));
    nLeft -= nPart;
    return nPart;
}

Status FromZlib(int nCode)
{
    switch (nCode)
    {
    case Z_MEM_ERROR:
        return Status::eNoMemory;
    case Z_STREAM_END:
    case Z_BUF_ERROR:
        return Status::eTruncated;
    default:
        return Status::eCorrupt;
    }
}

// Piece by piece, as far as the stream goes: says how many bytes are good. Goes on behind the last byte that is wanted,
// to the check sum, but not for ever.
Result Inflate(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput)
{
    constexpr std::size_t ENOUGH = std::size_t{1} << 20;
    constexpr int LAST_PART = 64; // of what zlib says in data_type
    constexpr int BETWEEN_PARTS = 128;
    z_stream oStream{};
    if (inflateInit(&oStream) != Z_OK)
        return {Status::eNoMemory, 0};
    std::array<unsigned char, 4096> oUnwanted;
    oStream.next_in = const_cast<unsigned char*>(input);
    oStream.next_out = output;
    std::size_t nInputLeft = nInput;
    std::size_t nOutputLeft = nOutput;
    bool bOnlyEndMark = true; // of what may still follow once the output is full
    int nCode = Z_OK;
    while (nCode == Z_OK && oStream.total_out <= nOutput + nOutput + ENOUGH)
    {
        if (oStream.avail_in == 0)
            oStream.avail_in = TakePart(nInputLeft);
        if (oStream.avail_out == 0 && nOutputLeft > 0)
            oStream.avail_out = TakePart(nOutputLeft);
        else if (oStream.avail_out == 0)
        {
            oStream.next_out = oUnwanted.data();
            oStream.avail_out = oUnwanted.size();
        }
        nCode = inflate(&oStream, Z_BLOCK);
        const bool bBetween = (oStream.data_type & BETWEEN_PARTS) != 0;
        if (bBetween && oStream.total_out >= nOutput)
            bOnlyEndMark = (oStream.data_type & LAST_PART) != 0 || oStream.avail_in + nInputLeft == 0;
        if (bBetween && nCode == Z_BUF_ERROR)
            nCode = Z_OK;
    }
    const std::size_t nGiven = oStream.total_out;
    inflateEnd(&oStream);
    if (nGiven < nOutput)
        return {FromZlib(nCode), nGiven};
    if (nCode == Z_STREAM_END || (nCode == Z_BUF_ERROR && nGiven == nOutput && bOnlyEndMark))
        return {Status::eDone, nOutput};
    if (nCode == Z_OK)
        return {Status::eDone, nOutput, true};
    return {nCode == Z_MEM_ERROR ? Status::eNoMemory : Status::eCorrupt, nOutput};
}

} // namespace

void DeflateDecoder::Free::operator()(libdeflate_decompressor* poDecompressor) const
{
    libdeflate_free_decompressor(poDecompressor);
}

Result DeflateDecoder::Decode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                              std::size_t nOutput)
{
    if (!mpoDecompressor)
        mpoDecompressor.reset(libdeflate_alloc_decompressor());
    if (mpoDecompressor)
    {
        std::size_t nBytes = 0;
        const libdeflate_result oResult =
            libdeflate_zlib_decompress(mpoDecompressor.get(), input, nInput, output, nOutput, &nBytes);
        if (oResult == LIBDEFLATE_SUCCESS)
            return {nBytes == nOutput ? Status::eDone : Status::eTruncated, nBytes};
    }
    return Inflate(input, nInput, output, nOutput);
}

} // namespace krv::plugins::codec
