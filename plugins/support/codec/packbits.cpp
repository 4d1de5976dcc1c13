#include "plugins/support/codec/packbits.h"

#include "toolkit/simd/memoryaccess.h"

#include <algorithm>
#include <cstring>

namespace krv::plugins::codec
{

namespace
{

constexpr unsigned int NOTHING = 128; // the length that stands for no bytes
constexpr std::size_t LONGEST = 128;
constexpr std::size_t STEP = 16;

} // namespace

Result PackBitsDecoder::Decode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                               std::size_t nOutput)
{
    const unsigned char* const stop = input + nInput;
    unsigned char* const end = output + nOutput;
    unsigned char* out = output;
    const auto oFail = [&]
    {
        return Result{Status::eTruncated, static_cast<std::size_t>(out - output)};
    };
    while (out < end)
    {
        if (input == stop)
            return oFail();
        const unsigned int nLength = *input++;
        if (nLength == NOTHING)
            continue;
        const bool bRun = nLength > NOTHING;
        const std::size_t nBytes = bRun ? 257 - nLength : nLength + 1;
        if (static_cast<std::size_t>(stop - input) < (bRun ? 1 : nBytes))
            return oFail();
        const auto nRoom = static_cast<std::size_t>(end - out);
        const bool bInside = nRoom >= LONGEST + STEP && stop - input >= static_cast<std::ptrdiff_t>(LONGEST + STEP);
        const std::size_t nWanted = std::min(nBytes, nRoom);
        if (bInside && bRun)
            for (std::size_t i = 0; i < nBytes; i += STEP)
                std::memset(out + i, *input, STEP);
        else if (bInside)
            for (std::size_t i = 0; i < nBytes; i += STEP)
                simd::Copy16(out + i, input + i);
        else if (bRun)
            std::memset(out, *input, nWanted);
        else
            std::memcpy(out, input, nWanted);
        input += bRun ? 1 : nBytes;
        out += nWanted;
        if (nWanted < nBytes)
            return {Status::eDone, nOutput, true};
    }
    return {Status::eDone, nOutput};
}

} // namespace krv::plugins::codec
