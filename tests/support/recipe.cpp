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

// One direction of a window with margins: the pixels of the buffer that are read, and where the buffer starts.
struct Span
{
    long long mnStart;
    long long mnFirst;
    long long mnCount;

    Span(long long nPosition, long long nSize, long long nMargin, long long nImage)
        : mnStart(nPosition - nMargin), mnFirst(0), mnCount(nSize + 2 * nMargin)
    {
        const bool bAfter = nPosition + nSize + nMargin >= nImage;
        if (mnStart < 0)
        {
            mnFirst = nMargin;
            mnCount -= nMargin;
        }
        if (bAfter)
            mnCount -= nMargin;
    }

    long long Source(long long nIndex, eMarginBehaviour eBehaviour) const
    {
        const long long nFolded = FoldNaively(nIndex - mnFirst, mnCount, eBehaviour);
        return nFolded < 0 ? -1 : mnStart + mnFirst + nFolded;
    }
};

} // namespace

long long FoldNaively(long long nIndex, long long nLength, eMarginBehaviour eBehaviour)
{
    while (nIndex < 0 || nIndex >= nLength)
    {
        const bool bBefore = nIndex < 0;
        if (eBehaviour == eConstant || eBehaviour == eNoData)
            return -1;
        if (eBehaviour == eReplicate || nLength == 1)
            return bBefore ? 0 : nLength - 1;
        if (eBehaviour == eMirror)
            nIndex = bBefore ? -1 - nIndex : 2 * nLength - 1 - nIndex;
        else if (eBehaviour == eMirror101)
            nIndex = bBefore ? -nIndex : 2 * nLength - 2 - nIndex;
        else
            nIndex += bBefore ? nLength : -nLength;
    }
    return nIndex;
}

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

std::string ReferenceImage::Pixel(long long nX, long long nY) const
{
    return moBytes.substr(static_cast<std::size_t>(nY * mnWidth + nX) * mnPixelBytes, mnPixelBytes);
}

std::string ReferenceImage::Window(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight) const
{
    std::string oBytes;
    for (unsigned int nRow = nY; nRow < nY + nHeight; ++nRow)
        for (unsigned int nColumn = nX; nColumn < nX + nWidth; ++nColumn)
            oBytes += Pixel(nColumn, nRow);
    return oBytes;
}

std::string ReferenceImage::Part(std::string buffer, long long nX, long long nY, unsigned int nWidth,
                                 unsigned int nHeight, unsigned int nPartX, unsigned int nPartY,
                                 unsigned int nPartWidth, unsigned int nPartHeight) const
{
    for (long long nRow = 0; nRow < nHeight; ++nRow)
    {
        for (long long nColumn = 0; nColumn < nWidth; ++nColumn)
        {
            const bool bPart = nColumn >= nPartX && nColumn < 0ll + nPartX + nPartWidth && nRow >= nPartY &&
                               nRow < 0ll + nPartY + nPartHeight;
            const bool bImage = nX + nColumn >= 0 && nX + nColumn < mnWidth && nY + nRow >= 0 && nY + nRow < mnHeight;
            if (bPart && bImage)
                buffer.replace(static_cast<std::size_t>(nRow * nWidth + nColumn) * mnPixelBytes, mnPixelBytes,
                               Pixel(nX + nColumn, nY + nRow));
        }
    }
    return buffer;
}

std::string ReferenceImage::WithMargins(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                        unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) const
{
    const Span oColumns(nX, nWidth, nXMargin, mnWidth);
    const Span oRows(nY, nHeight, nYMargin, mnHeight);
    std::string oBytes;
    for (long long nRow = 0; nRow < nHeight + 2ll * nYMargin; ++nRow)
    {
        for (long long nColumn = 0; nColumn < nWidth + 2ll * nXMargin; ++nColumn)
        {
            const long long nSourceX = oColumns.Source(nColumn, eBehaviour);
            const long long nSourceY = oRows.Source(nRow, eBehaviour);
            oBytes += nSourceX < 0 || nSourceY < 0 ? std::string(mnPixelBytes, '\0') : Pixel(nSourceX, nSourceY);
        }
    }
    return oBytes;
}

} // namespace krv::test
