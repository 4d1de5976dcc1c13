#pragma once

#include <algorithm>
#include <memory>
#include <random>
#include <string>
#include <vector>

// What the tests of the block codecs share.
namespace krv::test
{

using Bytes = std::vector<unsigned char>;

// Memory of exactly nBytes bytes, so that a sanitizer sees the first byte beyond it.
class Exact
{
public:
    explicit Exact(std::size_t nBytes) : mpoBytes(new unsigned char[nBytes]), mnBytes(nBytes) {}
    explicit Exact(const Bytes& oBytes) : Exact(oBytes.size())
    {
        std::copy(oBytes.begin(), oBytes.end(), mpoBytes.get());
    }

    unsigned char* data() { return mpoBytes.get(); }
    std::size_t size() const { return mnBytes; }
    Bytes ToBytes(std::size_t nCount) const { return {mpoBytes.get(), mpoBytes.get() + nCount}; }
    Bytes ToBytes() const { return ToBytes(mnBytes); }

private:
    std::unique_ptr<unsigned char[]> mpoBytes;
    std::size_t mnBytes;
};

inline Bytes RandomBytes(std::mt19937& oRandom, std::size_t nCount)
{
    Bytes oBytes(nCount);
    for (unsigned char& nByte : oBytes)
        nByte = static_cast<unsigned char>(oRandom());
    return oBytes;
}

// Data of very different compressibility, chosen by nKind: noise, few values, runs, a ramp, slow waves, one value.
inline Bytes MakeData(std::mt19937& oRandom, unsigned int nKind, std::size_t nCount)
{
    Bytes oBytes = RandomBytes(oRandom, nCount);
    unsigned char nValue = 0;
    for (std::size_t i = 0; i < nCount; ++i)
    {
        const unsigned char nNoise = oBytes[i];
        switch (nKind % 6)
        {
        case 0:
            break;
        case 1:
            oBytes[i] = nNoise % 3;
            break;
        case 2:
            nValue = nNoise < 20 ? static_cast<unsigned char>(oRandom()) : nValue;
            oBytes[i] = nValue;
            break;
        case 3:
            oBytes[i] = static_cast<unsigned char>(i / 7);
            break;
        case 4:
            nValue = static_cast<unsigned char>(nValue + nNoise % 5 - 2);
            oBytes[i] = nValue;
            break;
        default:
            oBytes[i] = 77;
        }
    }
    return oBytes;
}

} // namespace krv::test
