#include "plugins/support/codec/lzw.h"

#include <array>
#include <cstdint>
#include <cstring>

namespace krv::plugins::codec
{

namespace
{

constexpr std::uint32_t CLEAR_CODE = 256;
constexpr std::uint32_t END_CODE = 257;
constexpr std::uint32_t FIRST_FREE_CODE = 258;
constexpr std::uint32_t LAST_CODE = 4094;
constexpr unsigned int FIRST_WIDTH = 9;

// Codes go out most significant bit first, in the first edition least significant bit first.
template <bool bOld>
class BitWriter
{
public:
    explicit BitWriter(unsigned char* pOutput) : mpNext(pOutput), mpBegin(pOutput) {}

    void Put(std::uint32_t nCode, unsigned int nWidth)
    {
        mnBits = bOld ? mnBits | std::uint64_t{nCode} << mnCount : mnBits << nWidth | nCode;
        mnCount += nWidth;
        while (mnCount >= 8)
        {
            mnCount -= 8;
            *mpNext++ = static_cast<unsigned char>(bOld ? mnBits : mnBits >> mnCount);
            mnBits = bOld ? mnBits >> 8 : mnBits;
        }
    }

    std::size_t Finish()
    {
        if (mnCount > 0)
            *mpNext++ = static_cast<unsigned char>(bOld ? mnBits : mnBits << (8 - mnCount));
        return static_cast<std::size_t>(mpNext - mpBegin);
    }

private:
    unsigned char* mpNext;
    unsigned char* mpBegin;
    std::uint64_t mnBits = 0;
    unsigned int mnCount = 0;
};

} // namespace

// Strings by (code of all but the last byte, last byte); an entry holds both and the string's own code. 0 is empty: no
// string has the code 0.
struct LzwEncoder::Table
{
    static constexpr std::size_t SIZE = 16384;

    std::array<std::uint32_t, SIZE> moEntries;

    void Clear() { std::memset(moEntries.data(), 0, sizeof(moEntries)); }

    // The code of a string; 0 when it is new, and then it gets nNewCode.
    std::uint32_t FindOrAdd(std::uint32_t nPrefix, unsigned char nByte, std::uint32_t nNewCode)
    {
        const std::uint32_t nKey = nPrefix << 8 | nByte;
        std::size_t nAt = (nKey * 0x9E3779B1u) >> 18;
        while (moEntries[nAt] != 0)
        {
            if (moEntries[nAt] >> 12 == nKey)
                return moEntries[nAt] & 0xFFF;
            nAt = (nAt + 1) % SIZE;
        }
        moEntries[nAt] = nKey << 12 | nNewCode;
        return 0;
    }
};

LzwEncoder::LzwEncoder() : mpoTable(std::make_unique<Table>()) {}
LzwEncoder::~LzwEncoder() = default;

std::size_t LzwEncoder::GetBound(std::size_t nInput) const
{
    // A code of at most 12 bits for every byte, clear codes, the end and a rest.
    return nInput + nInput / 2 + nInput / 2048 + 16;
}

void LzwEncoder::TakeForm(std::span<const unsigned char> oLike)
{
    mbOld = LzwDecoder::IsOldStyle(oLike.data(), oLike.size());
}

std::size_t LzwEncoder::Encode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t)
{
    return mbOld ? Run<true>(input, nInput, output) : Run<false>(input, nInput, output);
}

template <bool bOld>
std::size_t LzwEncoder::Run(const unsigned char* input, std::size_t nInput, unsigned char* output)
{
    BitWriter<bOld> oBits(output);
    std::uint32_t nFree = FIRST_FREE_CODE;
    unsigned int nWidth = FIRST_WIDTH;
    mpoTable->Clear();
    oBits.Put(CLEAR_CODE, nWidth);
    // The width grows one code early, in the first edition just in time; the clear code is written before the table is
    // full.
    const auto Count = [&]
    {
        ++nFree;
        if (nFree == LAST_CODE)
        {
            oBits.Put(CLEAR_CODE, nWidth);
            mpoTable->Clear();
            nFree = FIRST_FREE_CODE;
            nWidth = FIRST_WIDTH;
        }
        else if (nFree > (1u << nWidth) - (bOld ? 0 : 1))
            ++nWidth;
    };
    if (nInput > 0)
    {
        std::uint32_t nString = input[0];
        for (std::size_t nAt = 1; nAt < nInput; ++nAt)
        {
            const std::uint32_t nLonger = mpoTable->FindOrAdd(nString, input[nAt], nFree);
            if (nLonger != 0)
            {
                nString = nLonger;
                continue;
            }
            oBits.Put(nString, nWidth);
            Count();
            nString = input[nAt];
        }
        oBits.Put(nString, nWidth);
        Count();
    }
    oBits.Put(END_CODE, nWidth);
    return oBits.Finish();
}

} // namespace krv::plugins::codec
