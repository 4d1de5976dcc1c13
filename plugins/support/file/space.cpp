#include "plugins/support/file/space.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace krv::plugins::support
{

namespace
{

// Whole pages of the system's cache are written and read faster where the cache has them too.
constexpr std::uint64_t PAGE = 4096;
constexpr std::uint64_t LARGE_PIECE = 32768;

} // namespace

Space::Space(const std::string& fileName, std::uint64_t nEnd, std::uint64_t nLimit, const std::string& limitText)
    : moFileName(fileName), moLimitText(limitText), mnEnd(nEnd), mnLimit(nLimit)
{
}

void Space::AddGap(std::uint64_t nOffset, std::uint64_t nBytes)
{
    if (nBytes != 0)
        AddFree(nOffset, nBytes);
}

void Space::AddUnused(std::uint64_t nOffset, std::uint64_t nBytes)
{
    moGivenUp.push_back({{nOffset, nBytes, 0}, 1});
}

void Space::AddUnusedBetween(std::vector<Extent> oPieces, std::uint64_t nEnd)
{
    oPieces.push_back({nEnd, 0, 0});
    std::sort(oPieces.begin(), oPieces.end(),
              [](const Extent& oFirst, const Extent& oSecond) { return oFirst.mnOffset < oSecond.mnOffset; });
    std::uint64_t nDone = 0;
    for (const Extent& oPiece : oPieces)
    {
        if (oPiece.mnOffset > nDone)
            AddUnused(nDone, oPiece.mnOffset - nDone);
        nDone = std::max(nDone, oPiece.GetEnd() + oPiece.GetEnd() % 2);
    }
}

void Space::Keep(std::uint64_t nOffset, std::uint64_t nBytes)
{
    if (nBytes != 0)
        moKept[nOffset] = nOffset + nBytes;
}

Extent Space::Allocate(std::uint64_t nBytes, std::uint64_t nReserve, const Place& oPlace)
{
    const Extent oExtent = Take(nBytes, nReserve, oPlace);
    if (mbOperation)
        moTaken.push_back(oExtent);
    return oExtent;
}

void Space::Adopt()
{
    mbOperation = false;
    moTaken.clear();
    for (const auto& [oExtent, nKept] : std::exchange(moReleased, {}))
        Release(oExtent, nKept);
}

void Space::Undo()
{
    mbOperation = false;
    moReleased.clear();
    for (const Extent& oExtent : std::exchange(moTaken, {}))
        AddFree(oExtent.mnOffset, oExtent.mnBytes);
}

Extent Space::Take(std::uint64_t nBytes, std::uint64_t nReserve, const Place& oPlace)
{
    const std::uint64_t nTaken = nBytes + nBytes % 2;
    const auto oFit = moBySize.lower_bound({nTaken, 0});
    if (oFit != moBySize.end())
    {
        const auto [nSize, nOffset] = *oFit;
        RemoveFree(moFree.find(nOffset));
        if (nSize > nTaken)
            AddFree(nOffset + nTaken, nSize - nTaken);
        return {nOffset, nTaken, mnGeneration};
    }
    const bool bPages = nBytes >= LARGE_PIECE && nBytes % PAGE == 0;
    const std::uint64_t nOffset = mnEnd + (bPages ? (PAGE - mnEnd % PAGE) % PAGE : mnEnd % 2);
    if (nTaken > mnLimit || nReserve > mnLimit - nTaken || nOffset > mnLimit - nTaken - nReserve)
        throw IOException(moFileName, moFileName + ": " + moLimitText, oPlace);
    const std::uint64_t nGap = mnEnd + mnEnd % 2;
    mnEnd = nOffset + nTaken;
    if (nGap < nOffset)
        AddFree(nGap, nOffset - nGap);
    return {nOffset, nTaken, mnGeneration};
}

// The smallest of those that fit is taken, as ever.
std::optional<Extent> Space::AllocateBefore(std::uint64_t nBytes, std::uint64_t nEnd)
{
    const std::uint64_t nTaken = nBytes + nBytes % 2;
    for (auto oFit = moBySize.lower_bound({nTaken, 0}); oFit != moBySize.end(); ++oFit)
    {
        const auto [nSize, nOffset] = *oFit;
        if (nOffset + nTaken > nEnd)
            continue;
        RemoveFree(moFree.find(nOffset));
        if (nSize > nTaken)
            AddFree(nOffset + nTaken, nSize - nTaken);
        const Extent oExtent{nOffset, nTaken, mnGeneration};
        if (mbOperation)
            moTaken.push_back(oExtent);
        return oExtent;
    }
    return std::nullopt;
}

void Space::Release(const Extent& oExtent, std::uint64_t nKept)
{
    if (mbOperation)
        return moReleased.push_back({oExtent, nKept});
    nKept += nKept % 2;
    if (nKept >= oExtent.mnBytes)
        return;
    const Extent oRest{oExtent.mnOffset + nKept, oExtent.mnBytes - nKept, oExtent.mnGeneration};
    const auto oKept = moKept.lower_bound(oRest.mnOffset + oRest.mnBytes);
    if (oKept != moKept.begin() && std::prev(oKept)->second > oRest.mnOffset)
        return;
    if (IsFresh(oExtent))
        AddFree(oRest.mnOffset, oRest.mnBytes);
    else
        moGivenUp.push_back({oRest, 0});
}

void Space::Age(std::uint64_t nRoot)
{
    moRoots[nRoot] = mnGeneration++;
}

void Space::Reuse(const Roots& oHeld)
{
    const std::uint64_t nState = mnGeneration - 1;
    for (GivenUp& oPiece : moGivenUp)
        if (oPiece.mnSince == 0)
            oPiece.mnSince = nState;
    if (!oHeld)
        return;
    std::set<std::uint64_t> oStates; // 0 stands for one from before the file was opened
    for (const std::uint64_t nRoot : *oHeld)
        oStates.insert(moRoots.contains(nRoot) ? moRoots[nRoot] : 0);
    std::erase_if(moRoots,
                  [&](const auto& oRoot) { return oRoot.second != nState && !oStates.contains(oRoot.second); });
    std::erase_if(moGivenUp,
                  [&](const GivenUp& oPiece)
                  {
                      const auto oNeeds = oStates.lower_bound(oPiece.moExtent.mnGeneration);
                      if (oNeeds != oStates.end() && *oNeeds < oPiece.mnSince)
                          return false;
                      AddFree(oPiece.moExtent.mnOffset, oPiece.moExtent.mnBytes);
                      return true;
                  });
}

std::uint64_t Space::CountUnused() const
{
    std::uint64_t nBytes = 0;
    for (const auto& [nOffset, nFree] : moFree)
        nBytes += nFree;
    for (const GivenUp& oPiece : moGivenUp)
        nBytes += oPiece.moExtent.mnBytes;
    return nBytes;
}

std::uint64_t Space::CountFree(std::uint64_t nEnd) const
{
    std::uint64_t nBytes = 0;
    for (const auto& [nOffset, nFree] : moFree)
        if (nOffset < nEnd)
            nBytes += std::min(nFree, nEnd - nOffset);
    return nBytes;
}

std::uint64_t Space::FindUsedEnd() const
{
    std::map<std::uint64_t, std::uint64_t> oUnused(moFree); // offset, bytes
    for (const GivenUp& oPiece : moGivenUp)
        oUnused[oPiece.moExtent.mnOffset] = oPiece.moExtent.mnBytes;
    std::uint64_t nEnd = mnEnd;
    for (auto oPiece = oUnused.rbegin(); oPiece != oUnused.rend(); ++oPiece)
    {
        if (oPiece->first + oPiece->second < nEnd)
            break;
        nEnd = oPiece->first;
    }
    return nEnd;
}

std::uint64_t Space::CutEnd()
{
    if (!moFree.empty() && moFree.rbegin()->first + moFree.rbegin()->second == mnEnd)
    {
        mnEnd = moFree.rbegin()->first;
        RemoveFree(std::prev(moFree.end()));
    }
    return mnEnd;
}

void Space::RemoveFree(std::map<std::uint64_t, std::uint64_t>::iterator oFree)
{
    moBySize.erase({oFree->second, oFree->first});
    moFree.erase(oFree);
}

void Space::AddFree(std::uint64_t nOffset, std::uint64_t nBytes)
{
    const auto oNext = moFree.lower_bound(nOffset);
    if (oNext != moFree.end() && nOffset + nBytes == oNext->first)
    {
        nBytes += oNext->second;
        RemoveFree(oNext);
    }
    const auto oAfter = moFree.lower_bound(nOffset);
    if (oAfter != moFree.begin())
    {
        const auto oBefore = std::prev(oAfter);
        if (oBefore->first + oBefore->second == nOffset)
        {
            nOffset = oBefore->first;
            nBytes += oBefore->second;
            RemoveFree(oBefore);
        }
    }
    moFree[nOffset] = nBytes;
    moBySize.insert({nBytes, nOffset});
}

} // namespace krv::plugins::support
