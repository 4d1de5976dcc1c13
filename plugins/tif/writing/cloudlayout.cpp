#include "plugins/tif/writing/cloudlayout.h"

#include "plugins/support/file/roomrecord.h"
#include "plugins/tif/writing/directorybytes.h"

#include <algorithm>
#include <cstdint>
#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::size_t COPY_BYTES = std::size_t{1} << 20;

// A page with the places that it gets.
struct Placed
{
    PageModel moPage;
    const PageModel* mpOld;
    Extent moOffsetArray;
    Extent moCountArray;
};

std::uint64_t GetPixels(const PageModel& oPage)
{
    return oPage.moTags.GetNumber(TIFFTAG_IMAGEWIDTH, 0) * oPage.moTags.GetNumber(TIFFTAG_IMAGELENGTH, 0);
}

std::vector<Placed> Place(const std::vector<std::shared_ptr<PageModel>>& oPages)
{
    std::vector<Placed> oPlaced;
    for (const std::shared_ptr<PageModel>& poPage : oPages)
        oPlaced.push_back({*poPage, poPage.get(), {}, {}});
    return oPlaced;
}

// The image, its masks, and the levels from large to small.
void Sort(std::vector<Placed>& oSorted)
{
    std::stable_sort(oSorted.begin() + 1, oSorted.end(),
                     [](const Placed& oFirst, const Placed& oSecond)
                     { return GetPixels(oFirst.moPage) > GetPixels(oSecond.moPage); });
}

void PlaceDirectory(Placed& oPlaced, const FileHeader& oHeader, std::uint64_t nBehind, support::Space& oSpace)
{
    const std::size_t nWord = oHeader.mbBigTiff ? 8 : 4;
    PageModel& oPage = oPlaced.moPage;
    oPage.moDirectory = oSpace.Allocate(GetDirectoryBytes(oPage, oHeader) + nBehind);
    for (Tag& oTag : oPage.moTags.EditTags())
        if (oTag.GetBytes() > nWord)
            oTag.moStored = oSpace.Allocate(oTag.GetBytes());
    if (oPage.GetStriles() < 2)
        return;
    oPlaced.moOffsetArray = oSpace.Allocate(oPage.GetStriles() * nWord);
    oPlaced.moCountArray = oSpace.Allocate(oPage.GetStriles() * nWord);
}

void CopyBlocks(Placed& oPlaced, const support::File& oSource, support::Space& oSpace, support::File& oTarget)
{
    std::vector<unsigned char> oBytes;
    PageModel& oPage = oPlaced.moPage;
    for (std::size_t nAt = 0; nAt < oPage.GetStriles(); ++nAt)
    {
        const std::uint64_t nBytes = oPage.moByteCounts[nAt];
        oPage.moOffsets[nAt] = 0;
        if (nBytes == 0)
            continue;
        const Extent oNew = oSpace.Allocate(nBytes);
        for (std::uint64_t nDone = 0; nDone < nBytes; nDone += oBytes.size())
        {
            oBytes.resize(std::min<std::uint64_t>(nBytes - nDone, COPY_BYTES));
            oSource.Read(oPlaced.mpOld->moOffsets[nAt] + nDone, oBytes.data(), oBytes.size());
            oTarget.Write(oNew.mnOffset + nDone, oBytes.data(), oBytes.size());
        }
        oPage.moOffsets[nAt] = oNew.mnOffset;
    }
}

void WriteDirectory(const Placed& oPlaced, const FileHeader& oHeader, std::uint64_t nNext, support::File& oTarget)
{
    const auto Write = [&oTarget](const Extent& oPlace, const std::vector<unsigned char>& oBytes)
    {
        if (oPlace.mnBytes != 0)
            oTarget.Write(oPlace.mnOffset, oBytes.data(), oBytes.size());
    };
    const PageModel& oPage = oPlaced.moPage;
    Write(oPage.moDirectory,
          MakeDirectory(oPage, oHeader, oPlaced.moOffsetArray.mnOffset, oPlaced.moCountArray.mnOffset, nNext));
    for (const Tag& oTag : oPage.moTags.GetTags())
        Write(oTag.moStored, oTag.moBytes);
    Write(oPlaced.moOffsetArray, MakeArray(oPage.moOffsets, oHeader));
    Write(oPlaced.moCountArray, MakeArray(oPage.moByteCounts, oHeader));
}

} // namespace

void WriteCloudLayout(const std::vector<std::shared_ptr<PageModel>>& oPages, const FileHeader& oHeader,
                      const support::File& oSource, support::File& oTarget, bool bSorted)
{
    std::vector<Placed> oSorted = Place(oPages);
    if (bSorted)
        Sort(oSorted);
    support::Space oSpace(oTarget.GetName(), oHeader.GetBytes(), oHeader.mbBigTiff ? INT64_MAX : UINT32_MAX,
                          "the file would pass the limit of 4 GiB of classic TIFF");
    for (Placed& oPlaced : oSorted)
        PlaceDirectory(oPlaced, oHeader, &oPlaced == oSorted.data() ? support::RoomRecord::GetBytes(0) : 0, oSpace);
    for (auto oPlaced = oSorted.rbegin(); oPlaced != oSorted.rend(); ++oPlaced)
        CopyBlocks(*oPlaced, oSource, oSpace, oTarget);
    for (std::size_t nAt = 0; nAt < oSorted.size(); ++nAt)
        WriteDirectory(oSorted[nAt], oHeader,
                       nAt + 1 < oSorted.size() ? oSorted[nAt + 1].moPage.moDirectory.mnOffset : 0, oTarget);
    // All of the file was written here.
    const Extent& oRoot = oSorted.front().moPage.moDirectory;
    const std::uint64_t nRecord = oRoot.mnOffset + GetDirectoryBytes(oSorted.front().moPage, oHeader);
    support::RoomRecord oRecord;
    oRecord.mnFileBytes = std::max(oTarget.GetSize(), nRecord + oRecord.GetBytes());
    oTarget.Write(nRecord, oRecord.Make(oRoot.mnOffset).data(), oRecord.GetBytes());
    unsigned char aHeader[FileHeader::BYTES] = {};
    oHeader.Write(aHeader, oSorted.front().moPage.moDirectory.mnOffset);
    oTarget.Write(0, aHeader, oHeader.GetBytes());
}

} // namespace krv::plugins::tif
