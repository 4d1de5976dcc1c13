#include "tools/conformance/referenceimage.h"

namespace krv::conformance
{

namespace
{

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

} // namespace krv::conformance
