#include "plugins/tif/writing/space.h"

#include "toolkit/exceptions/exceptions.h"

#include <iterator>

namespace krv::plugins::tif
{

namespace
{

// Whole pages of the system's cache are written and read faster where the cache has them too.
constexpr std::uint64_t PAGE = 4096;
constexpr std::uint64_t LARGE_PIECE = 32768;

} // namespace

Space::Space(const std::string& fileName, std::uint64_t nEnd, std::uint64_t nLimit)
    : moFileName(fileName), mnEnd(nEnd), mnForeignEnd(nEnd), mnLimit(nLimit)
{
}

void Space::AddGap(std::uint64_t nOffset, std::uint64_t nBytes)
{
    mnForeignEnd = nOffset;
    AddFree(nOffset, nBytes);
}

Extent Space::Allocate(std::uint64_t nBytes, std::uint64_t nReserve, const Place& oPlace)
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
        throw IOException(moFileName,
                          moFileName + ": the file would pass the limit of 4 GiB of classic TIFF; write it as BigTIFF "
                                       "(option BIGTIFF=YES)",
                          oPlace);
    const std::uint64_t nGap = mnEnd + mnEnd % 2;
    mnEnd = nOffset + nTaken;
    if (nGap < nOffset)
        AddFree(nGap, nOffset - nGap);
    return {nOffset, nTaken, mnGeneration};
}

void Space::Release(const Extent& oExtent, std::uint64_t nKept)
{
    nKept += nKept % 2;
    if (oExtent.mnOffset < mnForeignEnd || nKept >= oExtent.mnBytes)
        return;
    const Extent oRest{oExtent.mnOffset + nKept, oExtent.mnBytes - nKept, oExtent.mnGeneration};
    if (IsFresh(oExtent))
        AddFree(oRest.mnOffset, oRest.mnBytes);
    else
        moPending.push_back(oRest);
}

void Space::Reuse()
{
    for (const Extent& oExtent : moPending)
        AddFree(oExtent.mnOffset, oExtent.mnBytes);
    moPending.clear();
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

} // namespace krv::plugins::tif
