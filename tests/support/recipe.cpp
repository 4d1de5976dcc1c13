#include "tests/support/recipe.h"

#include <cstdint>
#include <cstring>

namespace krv::test
{

namespace
{

std::uint64_t Hash(std::uint64_t nValue)
{
    nValue = (nValue ^ (nValue >> 30)) * 0xbf58476d1ce4e5b9ull;
    nValue = (nValue ^ (nValue >> 27)) * 0x94d049bb133111ebull;
    return nValue ^ (nValue >> 31);
}

template <typename T>
void Append(std::string& oBytes, T nValue, std::size_t nBytes = sizeof(T))
{
    oBytes.append(reinterpret_cast<const char*>(&nValue), nBytes);
}

// The bytes of one value in the machine's order.
void AppendRecipeValue(std::string& oBytes, const krv::gobs::DataType& oType, unsigned int nChannel, unsigned int nX,
                       unsigned int nY)
{
    for (unsigned int nPart = 0; nPart < oType.GetParts(); ++nPart)
    {
        const std::uint64_t nHash = Hash(Hash(nX * 0x100000001ull + nY) + nChannel * 2ull + nPart);
        const auto nReal = static_cast<double>(nHash >> 40) / 7.0 - 1e6;
        if (!oType.IsReal())
            Append(oBytes, nHash, oType.GetBits() / 8);
        else if (oType.GetBits() == 32)
            Append(oBytes, static_cast<float>(nReal));
        else
            Append(oBytes, nReal);
    }
}

} // namespace

std::string RecipeImage(unsigned int nWidth, unsigned int nHeight, const std::vector<unsigned int>& oChannels,
                        const krv::gobs::DataType& oType)
{
    std::string oBytes;
    for (unsigned int nY = 0; nY < nHeight; ++nY)
        for (unsigned int nX = 0; nX < nWidth; ++nX)
            for (const unsigned int nChannel : oChannels)
                AppendRecipeValue(oBytes, oType, nChannel, nX, nY);
    return oBytes;
}

} // namespace krv::test
