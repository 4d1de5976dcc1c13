#include "plugins/tif/reading/pagelist.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <charconv>
#include <map>
#include <set>
#include <string_view>
#include <unordered_set>
#include <utility>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

class Scanner
{
public:
    Scanner(PeekReader& oReader, const FileHeader& oHeader) : moReader(oReader), moHeader(oHeader) {}

    void WalkChain(std::uint64_t nOffset)
    {
        while (nOffset != 0)
            nOffset = Try(nOffset, false);
    }

    void WalkBelowFirst()
    {
        for (std::uint64_t nOffset : std::vector(moSubDirectories))
            if (nOffset != 0)
                Try(nOffset, true);
    }

    std::vector<PageSummary> Take() { return std::move(moPages); }
    const std::string& GetTrouble() const { return moTrouble; }

private:
    // The first trouble is kept: what follows may stem from it.
    std::uint64_t Try(std::uint64_t nOffset, bool bBelowFirst)
    {
        try
        {
            return Note(nOffset, bBelowFirst);
        }
        catch (const FileFormatException& oException)
        {
            if (moPages.empty())
                throw;
            if (moTrouble.empty())
                moTrouble = oException.GetMessage().substr(oException.GetFileName().size() + 2);
            return 0;
        }
    }

    // Returns where the next directory lies; 0 after the last one.
    std::uint64_t Note(std::uint64_t nOffset, bool bBelowFirst)
    {
        if (!moSeen.insert(nOffset).second)
            Fail("its directories form a circle");
        if (moPages.size() == MAXIMUM_PAGES)
            Fail("it has more than " + std::to_string(MAXIMUM_PAGES) + " directories");
        const RawDirectory oDirectory(moReader, moHeader, nOffset);
        if (moPages.empty())
            moSubDirectories = oDirectory.GetNumbers(moReader, TIFFTAG_SUBIFD, MAXIMUM_SUBDIRECTORIES);
        moPages.push_back(Summarise(oDirectory));
        moPages.back().mbBelowFirst = bBelowFirst;
        return oDirectory.GetNext();
    }

    [[noreturn]] void Fail(const std::string& what) const
    {
        ThrowDamaged(moReader.GetFile().GetName(), what, Place::Current());
    }

    PageSummary Summarise(const RawDirectory& oDirectory)
    {
        PageSummary oPage;
        oPage.mnOffset = oDirectory.GetOffset();
        oPage.mnWidth = oDirectory.GetNumber(moReader, TIFFTAG_IMAGEWIDTH, 0);
        oPage.mnHeight = oDirectory.GetNumber(moReader, TIFFTAG_IMAGELENGTH, 0);
        oPage.mnChannels = oDirectory.GetNumber(moReader, TIFFTAG_SAMPLESPERPIXEL, 1);
        oPage.mnBits = oDirectory.GetNumber(moReader, TIFFTAG_BITSPERSAMPLE, 1);
        oPage.mnFormat = oDirectory.GetNumber(moReader, TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_UINT);
        const std::uint64_t nKind = oDirectory.GetNumber(moReader, TIFFTAG_SUBFILETYPE, 0);
        const std::uint64_t nOldKind = oDirectory.GetNumber(moReader, TIFFTAG_OSUBFILETYPE, 0);
        oPage.mbReduced = (nKind & FILETYPE_REDUCEDIMAGE) != 0 || nOldKind == OFILETYPE_REDUCEDIMAGE;
        oPage.mbMask = (nKind & FILETYPE_MASK) != 0;
        oPage.mbPage = (nKind & FILETYPE_PAGE) != 0;
        oPage.mbDescribed = HasDescription(oDirectory);
        oPage.mnNumber = ParsePageName(ReadName(oDirectory), oPage.mbReduced);
        return oPage;
    }

    bool HasDescription(const RawDirectory& oDirectory)
    {
        const DirectoryEntry* pEntry = oDirectory.Find(TIFFTAG_IMAGEDESCRIPTION);
        char cFirst = 0;
        if (pEntry != nullptr && pEntry->mnType == TIFF_ASCII && pEntry->mnCount != 0)
            moReader.Read(pEntry->mnOffset, &cFirst, 1);
        return cFirst != 0;
    }

    std::string ReadName(const RawDirectory& oDirectory)
    {
        const DirectoryEntry* pEntry = oDirectory.Find(TIFFTAG_PAGENAME);
        if (pEntry == nullptr || pEntry->mnType != TIFF_ASCII || pEntry->mnCount > LONGEST_PAGE_NAME)
            return {};
        char aName[LONGEST_PAGE_NAME + 1] = {};
        moReader.Read(pEntry->mnOffset, aName, static_cast<std::size_t>(pEntry->mnCount));
        return aName;
    }

    PeekReader& moReader;
    FileHeader moHeader;
    std::unordered_set<std::uint64_t> moSeen;
    std::vector<std::uint64_t> moSubDirectories;
    std::vector<PageSummary> moPages;
    std::string moTrouble;
};

bool IsSmaller(const PageSummary& oPage, const PageSummary& oFull)
{
    return oPage.mnWidth != 0 && oPage.mnHeight != 0 && oPage.mnWidth <= oFull.mnWidth &&
           oPage.mnHeight <= oFull.mnHeight && (oPage.mnWidth < oFull.mnWidth || oPage.mnHeight < oFull.mnHeight);
}

template <typename Accept>
std::vector<PageLevel> CollectLevels(const std::vector<PageSummary>& oPages, Accept oAccept)
{
    std::map<unsigned int, PageSummary> oLevels;
    for (std::size_t nAt = 1; nAt < oPages.size(); ++nAt)
    {
        const PageSummary& oPage = oPages[nAt];
        if (!oPage.mbReduced || !IsSmaller(oPage, oPages.front()) || !oAccept(oPage))
            continue;
        const std::uint64_t nRatio = (2 * oPages.front().mnWidth + oPage.mnWidth) / (2 * oPage.mnWidth);
        const auto nLevel =
            oPage.mnNumber != 0 ? oPage.mnNumber : static_cast<unsigned int>(std::max<std::uint64_t>(2, nRatio));
        const auto [oFound, bNew] = oLevels.try_emplace(nLevel, oPage);
        if (!bNew && oPage.mnWidth * oPage.mnHeight > oFound->second.mnWidth * oFound->second.mnHeight)
            oFound->second = oPage;
    }
    std::vector<PageLevel> oList;
    for (const auto& [nLevel, oPage] : oLevels)
        oList.push_back({nLevel, oPage});
    return oList;
}

bool IsMaskForm(const PageSummary& oPage)
{
    return oPage.mbMask && oPage.mnChannels == 1 && (oPage.mnBits == 1 || oPage.mnBits == 8);
}

bool IsBitmap(const PageSummary& oPage, const PageSummary& oFull)
{
    const bool bZone = oPage.mbPage && !oPage.mbMask && oPage.mnNumber != 0 && oPage.mnChannels == 1 &&
                       (oPage.mnBits == 1 || oPage.mnBits == 8);
    return (bZone || IsMaskForm(oPage)) && !oPage.mbReduced && oPage.mnWidth == oFull.mnWidth &&
           oPage.mnHeight == oFull.mnHeight;
}

void NumberMasks(std::vector<PageSummary>& oMasks)
{
    std::set<unsigned int> oTaken;
    for (PageSummary& oMask : oMasks)
        if (!oTaken.insert(oMask.mnNumber).second)
            oMask.mnNumber = 0;
    unsigned int nNext = 1;
    for (PageSummary& oMask : oMasks)
    {
        if (oMask.mnNumber != 0)
            continue;
        while (oTaken.contains(nNext))
            ++nNext;
        oMask.mnNumber = nNext;
        oTaken.insert(nNext);
    }
}

} // namespace

std::string MakePageName(unsigned int nNumber, bool bLevel)
{
    return (bLevel ? "Level " : "Bitmap ") + std::to_string(nNumber);
}

unsigned int ParsePageName(const std::string& name, bool bLevel)
{
    const std::string_view start = bLevel ? "Level " : "Bitmap ";
    unsigned int nNumber = 0;
    if (name.starts_with(start))
        std::from_chars(name.data() + start.size(), name.data() + name.size(), nNumber);
    return name == MakePageName(nNumber, bLevel) && nNumber >= (bLevel ? 2u : 1u) ? nNumber : 0;
}

std::vector<PageSummary> ListPages(PeekReader& oReader, const FileHeader& oHeader, std::string& trouble)
{
    Scanner oScanner(oReader, oHeader);
    oScanner.WalkChain(oHeader.mnFirstDirectory);
    oScanner.WalkBelowFirst();
    trouble = oScanner.GetTrouble();
    return oScanner.Take();
}

std::vector<PageLevel> FindLevels(const std::vector<PageSummary>& oPages)
{
    return CollectLevels(oPages,
                         [&oPages](const PageSummary& oPage)
                         {
                             const PageSummary& oFull = oPages.front();
                             return !oPage.mbMask && oPage.mnChannels == oFull.mnChannels &&
                                    oPage.mnBits == oFull.mnBits && oPage.mnFormat == oFull.mnFormat;
                         });
}

std::vector<PageSummary> FindMasks(const std::vector<PageSummary>& oPages)
{
    std::vector<PageSummary> oMasks;
    for (std::size_t nAt = 1; nAt < oPages.size(); ++nAt)
    {
        if (IsBitmap(oPages[nAt], oPages.front()))
            oMasks.push_back(oPages[nAt]);
    }
    NumberMasks(oMasks);
    const auto IsBetter = [](const PageSummary& oOne, const PageSummary& oOther)
    {
        const auto Rank = [](const PageSummary& oMask)
        {
            const unsigned int nKind = !oMask.mbMask ? 2 : oMask.mbDescribed ? 1 : 0;
            return std::pair(nKind, nKind == 0 ? oMask.mnNumber : 0);
        };
        return Rank(oOne) < Rank(oOther);
    };
    const auto oBest = std::min_element(oMasks.begin(), oMasks.end(), IsBetter);
    if (oBest != oMasks.end())
        std::rotate(oMasks.begin(), oBest, oBest + 1);
    return oMasks;
}

std::vector<PageLevel> FindMaskLevels(const std::vector<PageSummary>& oPages)
{
    const std::vector<PageSummary> oMasks = FindMasks(oPages);
    if (oMasks.empty() || !oMasks.front().mbMask)
        return {};
    return CollectLevels(oPages, IsMaskForm);
}

unsigned int CountFurtherImages(const std::vector<PageSummary>& oPages)
{
    std::set<std::uint64_t> oBitmaps;
    for (const PageSummary& oMask : FindMasks(oPages))
        oBitmaps.insert(oMask.mnOffset);
    const auto nImages = std::count_if(oPages.begin(), oPages.end(),
                                       [&oBitmaps](const PageSummary& oPage) {
                                           return !oPage.mbReduced && !oPage.mbMask && !oPage.mbBelowFirst &&
                                                  !oBitmaps.contains(oPage.mnOffset);
                                       });
    return static_cast<unsigned int>(nImages) - (oPages.front().mbReduced || oPages.front().mbMask ? 0 : 1);
}

} // namespace krv::plugins::tif
