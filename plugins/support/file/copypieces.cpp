#include "plugins/support/file/copypieces.h"

#include <algorithm>
#include <cstddef>
#include <cstring>

namespace krv::plugins::support
{

namespace
{

// What is read is still in the processor's second cache when it is written.
constexpr std::size_t BUFFER_BYTES = 256 * 1024;
// Reading so many bytes in vain costs less than another call.
constexpr std::uint64_t MOST_GAP = 4096;
constexpr std::uint64_t FILLING = 1;

bool FollowsInTarget(const CopiedPiece& oFirst, const CopiedPiece& oNext)
{
    const std::uint64_t nEnd = oFirst.mnTo + oFirst.mnBytes;
    return oNext.mnTo >= nEnd && oNext.mnTo - nEnd <= FILLING;
}

// Pieces that have the same distance in both files become one.
void Merge(std::vector<CopiedPiece>& oPieces)
{
    std::size_t nLast = 0;
    for (std::size_t n = 1; n < oPieces.size(); ++n)
    {
        CopiedPiece& oLast = oPieces[nLast];
        const CopiedPiece oNext = oPieces[n];
        if (FollowsInTarget(oLast, oNext) && oNext.mnFrom - oLast.mnFrom == oNext.mnTo - oLast.mnTo)
            oLast.mnBytes = oNext.mnTo - oLast.mnTo + oNext.mnBytes;
        else
            oPieces[++nLast] = oNext;
    }
    oPieces.resize(std::min(oPieces.size(), nLast + 1));
}

// How many pieces from one on are read, and written, with one call.
std::size_t CountTogether(const std::vector<CopiedPiece>& oPieces, std::size_t nFirst)
{
    const CopiedPiece& oFirst = oPieces[nFirst];
    std::size_t nEnd = nFirst + 1;
    for (; nEnd < oPieces.size(); ++nEnd)
    {
        const CopiedPiece& oLast = oPieces[nEnd - 1];
        const CopiedPiece& oNext = oPieces[nEnd];
        const std::uint64_t nSourceEnd = oLast.mnFrom + oLast.mnBytes;
        if (!FollowsInTarget(oLast, oNext) || oNext.mnFrom < nSourceEnd || oNext.mnFrom - nSourceEnd > MOST_GAP ||
            std::max(oNext.mnFrom - oFirst.mnFrom, oNext.mnTo - oFirst.mnTo) + oNext.mnBytes > BUFFER_BYTES)
            break;
    }
    return nEnd - nFirst;
}

// Read as they lie in the source, written as they are to lie in the target.
void CopyTogether(const File& oFrom, File& oTo, const CopiedPiece* pPieces, std::size_t nPieces, unsigned char* pBuffer)
{
    const CopiedPiece& oFirst = pPieces[0];
    const CopiedPiece& oLast = pPieces[nPieces - 1];
    unsigned char* const pTarget = pBuffer + BUFFER_BYTES;
    oFrom.Read(oFirst.mnFrom, pBuffer, static_cast<std::size_t>(oLast.mnFrom + oLast.mnBytes - oFirst.mnFrom));
    for (std::size_t n = 0; n < nPieces; ++n)
    {
        unsigned char* const pPiece = pTarget + (pPieces[n].mnTo - oFirst.mnTo);
        std::memcpy(pPiece, pBuffer + (pPieces[n].mnFrom - oFirst.mnFrom), pPieces[n].mnBytes);
        if (n + 1 < nPieces && pPieces[n].mnTo + pPieces[n].mnBytes != pPieces[n + 1].mnTo)
            pPiece[pPieces[n].mnBytes] = 0;
    }
    oTo.Write(oFirst.mnTo, pTarget, static_cast<std::size_t>(oLast.mnTo + oLast.mnBytes - oFirst.mnTo));
}

} // namespace

void CopyPieces(const File& oFrom, File& oTo, std::vector<CopiedPiece> oPieces, Scratch& oScratch,
                const Copied& oCopied)
{
    unsigned char* const pBuffer = oScratch.Get(2 * BUFFER_BYTES);
    Merge(oPieces);
    for (std::size_t n = 0; n < oPieces.size();)
    {
        const std::size_t nTogether = CountTogether(oPieces, n);
        if (nTogether > 1)
        {
            CopyTogether(oFrom, oTo, oPieces.data() + n, nTogether, pBuffer);
            if (oCopied)
                oCopied(oPieces[n + nTogether - 1].mnTo + oPieces[n + nTogether - 1].mnBytes - oPieces[n].mnTo);
        }
        const CopiedPiece& oPiece = oPieces[n];
        for (std::uint64_t nDone = 0; nDone < oPiece.mnBytes && nTogether == 1;)
        {
            const auto nBytes = static_cast<std::size_t>(std::min<std::uint64_t>(oPiece.mnBytes - nDone, BUFFER_BYTES));
            oFrom.Read(oPiece.mnFrom + nDone, pBuffer, nBytes);
            oTo.Write(oPiece.mnTo + nDone, pBuffer, nBytes);
            nDone += nBytes;
            if (oCopied)
                oCopied(nBytes);
        }
        n += nTogether;
    }
}

} // namespace krv::plugins::support
