// How a TIFF file is laid out: the facet ILayoutDataset of its dataset.
#include "plugins/tif/reading/cloudheader.h"
#include "plugins/tif/tifdataset.h"

#include <algorithm>

namespace krv::plugins::tif
{

namespace
{

// An image that is no larger is read whole: it needs neither tiles nor levels.
constexpr std::uint64_t SMALL_SIDE = 512;

// The directories of the chain with the place of the first block that each has; 0 for one of which nothing is stored.
struct ChainPage
{
    PageSummary moSummary;
    std::shared_ptr<Page> mpoPage;
    Strile moFirst;
};

std::string SizeOf(const PageSummary& oPage)
{
    return std::to_string(oPage.mnWidth) + " x " + std::to_string(oPage.mnHeight);
}

bool IsLarge(const PageSummary& oPage)
{
    return std::max(oPage.mnWidth, oPage.mnHeight) > SMALL_SIDE;
}

Strile FindFirst(Page& oPage)
{
    const std::uint64_t nStriles = oPage.GetForm().GetStriles();
    for (std::uint64_t nAt = 0; nAt < nStriles; ++nAt)
        if (const Strile oStrile = oPage.GetStriles().Get(nAt); oStrile.mnOffset != 0 && oStrile.mnBytes != 0)
            return oStrile;
    return {};
}

void CheckTiles(const ChainPage& oPage, std::vector<std::string>& oReasons)
{
    if (IsLarge(oPage.moSummary) && !oPage.mpoPage->GetForm().mbTiled)
        oReasons.push_back("the image of " + SizeOf(oPage.moSummary) + " pixels is stored in strips, not in tiles");
}

void CheckOrder(const std::vector<ChainPage>& oPages, std::uint64_t nHeaderEnd, std::vector<std::string>& oReasons)
{
    std::uint64_t nFirstBlock = UINT64_MAX, nLastDirectory = 0;
    for (const ChainPage& oPage : oPages)
    {
        nLastDirectory = std::max(nLastDirectory, oPage.moSummary.mnOffset);
        if (oPage.moFirst.mnOffset != 0)
            nFirstBlock = std::min(nFirstBlock, oPage.moFirst.mnOffset);
    }
    // A directory begins at an even offset; some bytes for what stands between are no reason.
    constexpr std::uint64_t SLACK = 16;
    if (oPages.front().moSummary.mnOffset > nHeaderEnd + SLACK)
        oReasons.push_back("the first directory does not follow the header: it is at byte " +
                           std::to_string(oPages.front().moSummary.mnOffset));
    if (nLastDirectory > nFirstBlock)
        oReasons.push_back("pixels stand before the directory at byte " + std::to_string(nLastDirectory));
}

// Levels follow each other from large to small, their pixels the other way round.
void CheckLevels(const std::vector<ChainPage>& oPages, std::vector<std::string>& oReasons)
{
    const ChainPage* pBefore = &oPages.front();
    bool bAny = false;
    for (const ChainPage& oPage : oPages)
    {
        if (!oPage.moSummary.mbReduced || oPage.moSummary.mbMask)
            continue;
        bAny = true;
        if (oPage.moSummary.mnWidth > pBefore->moSummary.mnWidth)
            oReasons.push_back("the level of " + SizeOf(oPage.moSummary) + " pixels stands behind a smaller one");
        if (oPage.moSummary.mnOffset < pBefore->moSummary.mnOffset)
            oReasons.push_back("the directory of the level of " + SizeOf(oPage.moSummary) +
                               " pixels stands before that of a larger one");
        const Strile &oFirst = oPage.moFirst, &oLarger = pBefore->moFirst;
        if (oFirst.mnOffset != 0 && oLarger.mnOffset != 0 && oFirst.mnOffset > oLarger.mnOffset)
            oReasons.push_back("the pixels of the level of " + SizeOf(oPage.moSummary) +
                               " pixels stand behind those of a larger one");
        pBefore = &oPage;
    }
    if (!bAny && IsLarge(oPages.front().moSummary))
        oReasons.emplace_back("there are no levels in the file");
}

void CheckBlockLeaders(const std::vector<ChainPage>& oPages, const CloudHeader& oHeader,
                       std::vector<std::string>& oReasons)
{
    for (const ChainPage& oPage : oPages)
    {
        const Strile& oFirst = oPage.moFirst;
        if (!oHeader.mbLeaders || oFirst.mnOffset < CloudHeader::LEADER_BYTES)
            continue;
        unsigned char aLeader[CloudHeader::LEADER_BYTES] = {};
        oPage.mpoPage->GetFile().Read(oFirst.mnOffset - sizeof(aLeader), aLeader, sizeof(aLeader));
        if (ReadNumber(aLeader, sizeof(aLeader), false) != oFirst.mnBytes)
            oReasons.push_back("the file says that the size of each block stands in front of it, and the image of " +
                               SizeOf(oPage.moSummary) + " pixels has another there");
    }
}

} // namespace

std::string TifDataset::GetVariant()
{
    const FileHeader& oHeader = GetPage().GetHeader();
    return std::string(oHeader.mbBigTiff ? "BigTIFF" : "TIFF") + (oHeader.mbBigEndian ? ", big-endian" : "");
}

std::optional<std::vector<std::string>> TifDataset::CheckCloudLayout()
{
    Page& oImage = GetPage();
    if (IsWritten())
        Synchronize();
    std::string trouble;
    std::vector<ChainPage> oPages;
    const FileHeader oHeader = ReadHeader(oImage.GetReader());
    for (const PageSummary& oSummary : ListPages(oImage.GetReader(), oHeader, trouble))
    {
        auto poPage = std::make_shared<Page>(oImage.ShareFile(), oHeader, oSummary.mnOffset);
        const Strile oFirst = FindFirst(*poPage);
        oPages.push_back({oSummary, std::move(poPage), oFirst});
    }
    std::vector<std::string> oReasons;
    if (!trouble.empty())
        oReasons.push_back(trouble);
    const std::optional<CloudHeader> oCloud = CloudHeader::Read(oImage.GetFile(), oHeader);
    if (oCloud && oCloud->mbChanged)
        oReasons.emplace_back("the file was changed since it was laid out, as it says itself");
    for (const ChainPage& oPage : oPages)
        CheckTiles(oPage, oReasons);
    CheckOrder(oPages, oHeader.GetBytes() + (oCloud ? oCloud->moText.size() : 0), oReasons);
    CheckLevels(oPages, oReasons);
    if (oCloud && !oCloud->mbChanged)
        CheckBlockLeaders(oPages, *oCloud, oReasons);
    return oReasons;
}

} // namespace krv::plugins::tif
