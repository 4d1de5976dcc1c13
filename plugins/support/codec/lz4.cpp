#include "plugins/support/codec/lz4.h"

#include <lz4.h>
#include <lz4hc.h>

#include <algorithm>
#include <climits>
#include <new>

namespace krv::plugins::codec
{

namespace
{

const char* Text(const unsigned char* pBytes)
{
    return reinterpret_cast<const char*>(pBytes);
}

char* Text(unsigned char* pBytes)
{
    return reinterpret_cast<char*>(pBytes);
}

} // namespace

Result Lz4Decoder::Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput)
{
    if (nInput > INT_MAX || nOutput > INT_MAX)
        return {Status::eNoMemory, 0};
    const int nBytes =
        LZ4_decompress_safe(Text(input), Text(output), static_cast<int>(nInput), static_cast<int>(nOutput));
    if (nBytes < 0)
        return {Status::eCorrupt, 0};
    const auto nDone = static_cast<std::size_t>(nBytes);
    return {nDone == nOutput ? Status::eDone : Status::eTruncated, nDone};
}

Lz4Encoder::Lz4Encoder(int nLevel)
    : mnLevel(std::clamp(nLevel, 1, MAXIMUM_LEVEL)),
      mpoState(std::make_unique<unsigned char[]>(
          static_cast<std::size_t>(mnLevel == 1 ? LZ4_sizeofState() : LZ4_sizeofStateHC())))
{
}

// More than the library takes at a time fits no output.
std::size_t Lz4Encoder::GetBound(std::size_t nInput) const
{
    return nInput > LZ4_MAX_INPUT_SIZE ? SIZE_MAX : LZ4_COMPRESSBOUND(nInput);
}

std::size_t Lz4Encoder::Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                               std::size_t nOutput)
{
    const int nFrom = static_cast<int>(nInput), nTo = static_cast<int>(std::min<std::size_t>(nOutput, INT_MAX));
    const int nBytes = mnLevel == 1
                           ? LZ4_compress_fast_extState(mpoState.get(), Text(input), Text(output), nFrom, nTo, 1)
                           : LZ4_compress_HC_extStateHC(mpoState.get(), Text(input), Text(output), nFrom, nTo, mnLevel);
    if (nBytes <= 0)
        throw std::bad_alloc();
    return static_cast<std::size_t>(nBytes);
}

} // namespace krv::plugins::codec
