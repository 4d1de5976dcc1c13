#include "plugins/tif/writing/directorybytes.h"

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

std::size_t WordBytes(const FileHeader& oHeader)
{
    return oHeader.mbBigTiff ? 8 : 4;
}

} // namespace

std::uint64_t GetDirectoryBytes(std::size_t nEntries, const FileHeader& oHeader)
{
    const std::size_t nWord = WordBytes(oHeader);
    return (oHeader.mbBigTiff ? 8 : 2) + nEntries * (4 + 2 * nWord) + nWord;
}

std::uint64_t GetDirectoryBytes(const PageModel& oPage, const FileHeader& oHeader)
{
    return GetDirectoryBytes(oPage.moTags.GetTags().size() + 2, oHeader);
}

std::vector<unsigned char> MakeDirectory(const PageModel& oPage, const FileHeader& oHeader, std::uint64_t nOffsetArray,
                                         std::uint64_t nCountArray, std::uint64_t nNext)
{
    const bool bOrder = oHeader.mbBigEndian;
    const std::size_t nWord = WordBytes(oHeader);
    const std::vector<Tag>& oTags = oPage.moTags.GetTags();
    std::vector<unsigned char> oBytes;
    oBytes.reserve(GetDirectoryBytes(oPage, oHeader));
    AppendNumber(oBytes, oTags.size() + 2, oHeader.mbBigTiff ? 8 : 2, bOrder);
    const auto AddEntry = [&](std::uint16_t nTag, std::uint16_t nType, std::uint64_t nCount)
    {
        AppendNumber(oBytes, nTag, 2, bOrder);
        AppendNumber(oBytes, nType, 2, bOrder);
        AppendNumber(oBytes, nCount, nWord, bOrder);
    };
    const auto AddArray = [&](std::uint16_t nTag, const StrileList<std::uint64_t>& oValues, std::uint64_t nPlace)
    {
        AddEntry(nTag, oHeader.mbBigTiff ? TIFF_LONG8 : TIFF_LONG, oPage.GetStriles());
        AppendNumber(oBytes, oPage.GetStriles() == 1 ? oValues.front() : nPlace, nWord, bOrder);
    };
    const std::uint16_t nOffsets = oPage.IsTiled() ? TIFFTAG_TILEOFFSETS : TIFFTAG_STRIPOFFSETS;
    const std::uint16_t nCounts = oPage.IsTiled() ? TIFFTAG_TILEBYTECOUNTS : TIFFTAG_STRIPBYTECOUNTS;
    bool bOffsets = false;
    bool bCounts = false;
    const auto AddArraysBefore = [&](unsigned int nTag)
    {
        if (!bOffsets && nTag > nOffsets)
            AddArray(nOffsets, oPage.moOffsets, nOffsetArray), bOffsets = true;
        if (!bCounts && nTag > nCounts)
            AddArray(nCounts, oPage.moByteCounts, nCountArray), bCounts = true;
    };
    for (const Tag& oTag : oTags)
    {
        AddArraysBefore(oTag.mnTag);
        AddEntry(oTag.mnTag, oTag.mnType, oTag.mnCount);
        if (oTag.GetBytes() > nWord)
            AppendNumber(oBytes, oTag.moStored.mnOffset, nWord, bOrder);
        else
        {
            oBytes.insert(oBytes.end(), oTag.moBytes.begin(), oTag.moBytes.end());
            oBytes.resize(oBytes.size() + nWord - oTag.moBytes.size());
        }
    }
    AddArraysBefore(UINT32_MAX);
    AppendNumber(oBytes, nNext, nWord, bOrder);
    return oBytes;
}

std::vector<unsigned char> MakeArray(const StrileList<std::uint64_t>& oValues, const FileHeader& oHeader)
{
    std::vector<unsigned char> oBytes;
    oBytes.reserve(oValues.size() * WordBytes(oHeader));
    for (const std::uint64_t nValue : oValues)
        AppendNumber(oBytes, nValue, WordBytes(oHeader), oHeader.mbBigEndian);
    return oBytes;
}

} // namespace krv::plugins::tif
