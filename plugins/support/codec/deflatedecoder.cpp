#include "plugins/support/codec/deflatedecoder.h"

#include <libdeflate.h>
#include <zlib.h>

#include <algorithm>
#include <array>
#include <limits>

namespace krv::plugins::codec
{

struct DeflateDecoder::State
{
    libdeflate_decompressor* mpoDecompressor = libdeflate_alloc_decompressor();

    State() = default;
    State(const State&) = delete;
    State& operator=(const State&) = delete;
    ~State() { libdeflate_free_decompressor(mpoDecompressor); }
};

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

Status FromZlib(int nCode, std::size_t nInputLeft)
{
    if (nCode == Z_MEM_ERROR)
        return Status::eNoMemory;
    const bool bEnded = nCode == Z_STREAM_END || (nCode == Z_BUF_ERROR && nInputLeft == 0);
    return bEnded ? Status::eTruncated : Status::eCorrupt;
}

// Goes on behind the last byte that is wanted, to the check sum: in vain for as many bytes again, but not for ever.
int ReadOn(z_stream& oStream, std::size_t nMore)
{
    std::array<unsigned char, 4096> oUnwanted;
    int nCode = Z_OK;
    for (std::size_t i = 0; nCode == Z_OK && i <= nMore; i += oUnwanted.size())
    {
        oStream.next_out = oUnwanted.data();
        oStream.avail_out = oUnwanted.size();
        nCode = inflate(&oStream, Z_NO_FLUSH);
    }
    return nCode;
}

// Piece by piece, as far as the stream goes: says how many bytes are good, and stops when the output is full.
Result Inflate(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput)
{
    z_stream oStream{};
    if (inflateInit(&oStream) != Z_OK)
        return {Status::eNoMemory, 0};
    oStream.next_in = const_cast<unsigned char*>(input);
    oStream.next_out = output;
    std::size_t nInputLeft = nInput;
    std::size_t nOutputLeft = nOutput;
    int nCode = Z_OK;
    while (nCode == Z_OK && (oStream.avail_out > 0 || nOutputLeft > 0))
    {
        if (oStream.avail_in == 0)
            oStream.avail_in = TakePart(nInputLeft);
        if (oStream.avail_out == 0)
            oStream.avail_out = TakePart(nOutputLeft);
        nCode = inflate(&oStream, Z_NO_FLUSH);
    }
    const auto nBytes = static_cast<std::size_t>(oStream.next_out - output);
    nCode = nCode == Z_OK ? ReadOn(oStream, nOutput) : nCode;
    const Status oFault = FromZlib(nCode, oStream.avail_in + nInputLeft);
    inflateEnd(&oStream);
    return {nBytes == nOutput && nCode != Z_DATA_ERROR ? Status::eDone : oFault, nBytes};
}

} // namespace

DeflateDecoder::DeflateDecoder() : mpoState(std::make_unique<State>()) {}
DeflateDecoder::~DeflateDecoder() = default;
DeflateDecoder::DeflateDecoder(DeflateDecoder&&) noexcept = default;
DeflateDecoder& DeflateDecoder::operator=(DeflateDecoder&&) noexcept = default;

Result DeflateDecoder::Decode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                              std::size_t nOutput)
{
    if (mpoState->mpoDecompressor != nullptr)
    {
        std::size_t nBytes = 0;
        const libdeflate_result oResult =
            libdeflate_zlib_decompress(mpoState->mpoDecompressor, input, nInput, output, nOutput, &nBytes);
        if (oResult == LIBDEFLATE_SUCCESS)
            return {nBytes == nOutput ? Status::eDone : Status::eTruncated, nBytes};
    }
    return Inflate(input, nInput, output, nOutput);
}

} // namespace krv::plugins::codec
