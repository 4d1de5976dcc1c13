#include "plugins/support/writing/narrowsamples.h"

#include "plugins/support/codec/bits.h"

#include <vector>

namespace krv::plugins::support
{

namespace
{

constexpr unsigned int HALF_BITS = 16;
constexpr unsigned int FLOAT24_BITS = 24;
constexpr unsigned int MOST_BITS = 32;

HeldBlocks::SettlePixels ThereAndBack(decltype(&codec::FloatToHalf) pNarrow, decltype(&codec::HalfToFloat) pWiden,
                                      std::size_t nNarrowBytes)
{
    return [=](unsigned char* pPixels, std::size_t nBytes)
    {
        const std::size_t nCount = nBytes / sizeof(float);
        std::vector<unsigned char> oNarrow(nCount * nNarrowBytes);
        pNarrow(pPixels, oNarrow.data(), nCount);
        pWiden(oNarrow.data(), pPixels, nCount);
    };
}

} // namespace

bool CanNarrow(const krv::gobs::DataType& oType, unsigned int nBits)
{
    const unsigned int nWhole = oType.GetBits();
    if (oType.IsComplex() || nBits == 0 || nBits >= nWhole)
        return false;
    if (oType.IsReal())
        return nWhole == 32 && (nBits == HALF_BITS || nBits == FLOAT24_BITS);
    return nBits <= MOST_BITS && (nWhole == 8 || nBits > nWhole / 2);
}

HeldBlocks::SettlePixels MakeNarrowing(const krv::gobs::DataType& oType, unsigned int nBits)
{
    if (oType.IsReal())
        return nBits == HALF_BITS ? ThereAndBack(&codec::FloatToHalf, &codec::HalfToFloat, 2)
                                  : ThereAndBack(&codec::FloatToFloat24, &codec::Float24ToFloat, 3);
    return [nValueBytes = std::size_t{oType.GetValueBits()} / 8, nBits,
            bSigned = oType.IsSigned()](unsigned char* pPixels, std::size_t nBytes)
    {
        codec::FitBits(pPixels, nBytes / nValueBytes, nValueBytes, nBits, bSigned);
    };
}

} // namespace krv::plugins::support
