#pragma once

#include <cstddef>
#include <cstdint>
#include <random>
#include <stdexcept>
#include <string>

namespace krv::fuzz
{

// The decisions that an input stands for, read from its bytes one after the other. Behind their end every answer is 0.
class Choices
{
public:
    Choices(const std::uint8_t* poBytes, std::size_t nBytes) : mpNext(poBytes), mpEnd(poBytes + nBytes) {}

    bool IsAtEnd() const { return mpNext == mpEnd; }

    // A number below nEnd, which is above 0; takes as many bytes as such numbers have.
    unsigned int Below(std::size_t nEnd)
    {
        std::uint64_t nValue = 0;
        for (std::uint64_t nRest = nEnd - 1; nRest != 0; nRest >>= 8)
            nValue = nValue << 8 | (IsAtEnd() ? 0 : *mpNext++);
        return static_cast<unsigned int>(nValue % nEnd);
    }
    int Between(int nFirst, int nLast)
    {
        return nFirst + static_cast<int>(Below(static_cast<std::size_t>(nLast - nFirst) + 1));
    }
    bool OneIn(unsigned int nEnd) { return Below(nEnd) == 1; }

    template <class List>
    const auto& Of(const List& oList)
    {
        return oList[Below(std::size(oList))];
    }

    // Any bytes, at most so many.
    std::string Text(std::size_t nMost)
    {
        std::string text(Below(nMost + 1), '\0');
        for (char& nByte : text)
            nByte = static_cast<char>(Below(256));
        return text;
    }

    // For bulk that need not be chosen byte by byte.
    std::mt19937 Random() { return std::mt19937(Below(65536)); }

private:
    const std::uint8_t* mpNext;
    const std::uint8_t* mpEnd;
};

// What must hold for every input. The exception passes everything that treats a krv::Exception as an answer.
inline void Check(bool bHolds, const std::string& what)
{
    if (!bHolds)
        throw std::logic_error(what);
}

} // namespace krv::fuzz
