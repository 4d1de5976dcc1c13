// The mask pages of a TIFF file: the facet IBitmapDataset of its dataset.
#include "plugins/support/image/rasterio.h"
#include "plugins/support/image/stackedio.h"
#include "plugins/support/overviewmanager.h"
#include "plugins/tif/reading/metadata.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/metadatawriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>

namespace krv::plugins::tif
{

namespace
{

// What of a mask page's record is not the bitmap's own.
constexpr const char* MASK_KEYS[] = {"ImageDescription", "Photometric", "PageName"};

} // namespace

std::vector<unsigned int> TifDataset::GetBitmapList() const
{
    std::vector<unsigned int> oList;
    for (const PageSummary& oMask : GetPages().moMasks)
        oList.push_back(oMask.mnNumber);
    std::sort(oList.begin(), oList.end());
    if (!HasOwnMask())
        for (const unsigned int nMask : GetSidecars().ListMasks())
            oList.push_back(support::FIRST_BESIDE + nMask);
    return oList;
}

bool TifDataset::HasOwnMask() const
{
    return GetLevelBitmap() != 0 ||
           std::any_of(GetPages().moMasks.begin(), GetPages().moMasks.end(),
                       [](const PageSummary& oMask) { return oMask.mbMask && !oMask.mbDescribed; });
}

unsigned int TifDataset::FindBeside(unsigned int nBitmap) const
{
    const unsigned int nMask = nBitmap > support::FIRST_BESIDE ? nBitmap - support::FIRST_BESIDE : 0;
    return nMask != 0 && !HasOwnMask() && GetSidecars().HasMask(nMask) ? nMask : 0;
}

const PageSummary& TifDataset::GetMask(unsigned int nBitmap, const Place& oPlace) const
{
    const std::vector<PageSummary>& oMasks = GetPages().moMasks;
    const auto oFound = std::find_if(oMasks.begin(), oMasks.end(),
                                     [nBitmap](const PageSummary& oMask) { return oMask.mnNumber == nBitmap; });
    if (oFound == oMasks.end())
        Refuse("bitmap " + std::to_string(nBitmap) + " does not exist; there are " + std::to_string(oMasks.size()),
               oPlace);
    return *oFound;
}

krv::datasources::IRasterIO* TifDataset::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts;
    for (unsigned int nBitmap : oBitmaps)
        if (const unsigned int nBeside = FindBeside(nBitmap))
            oParts.emplace_back(GetSidecars().OpenMask(nBeside, false));
        else
            oParts.push_back(std::make_unique<support::RasterIO>(
                OpenPage(GetMask(nBitmap, Place::Current()).mnOffset, PixelUse::eBitmap),
                std::vector<unsigned int>{1}));
    if (oParts.size() == 1)
        return oParts.front().release();
    return new support::StackedIO(std::move(oParts), 1, 1);
}

// The others keep their numbers by name.
void TifDataset::DeleteBitmap(unsigned int nBitmap)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("bitmaps cannot be deleted", oPlace);
    const std::uint64_t nGone = GetMask(nBitmap, oPlace).mnOffset;
    const PageTable oTable = GetPages();
    std::vector<std::uint64_t> oGone = {nGone};
    if (oTable.moMasks.front().mnOffset == nGone)
        for (const PageLevel& oLevel : oTable.moMaskLevels)
            oGone.push_back(oLevel.moPage.mnOffset);
    Edit(
        [&]
        {
            for (const PageSummary& oMask : oTable.moMasks)
            {
                TagList& oTags = oEditor.GetPage(oMask.mnOffset)->moTags;
                const std::string name = MakePageName(oMask.mnNumber, false);
                if (oTags.GetText(TIFFTAG_PAGENAME) != name)
                    oTags.SetText(TIFFTAG_PAGENAME, name);
            }
            for (const std::uint64_t nPage : oGone)
                oEditor.RemovePage(nPage);
        });
    for (const std::uint64_t nPage : oGone)
        moImages.erase({nPage, PixelUse::eBitmap});
}

unsigned int TifDataset::CreateBitmap()
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("bitmaps cannot be added", oPlace);
    std::vector<unsigned int> oList = GetBitmapList();
    std::erase_if(oList, [this](unsigned int nBitmap) { return FindBeside(nBitmap) != 0; });
    if (!oList.empty() && oList.back() == UINT_MAX)
        Refuse("the numbers of bitmaps are used up", oPlace);
    const unsigned int nBitmap = oList.empty() ? 1 : oList.back() + 1;
    Edit([&] { AddPage(MakeBitmapPage(*oEditor.GetPages().front(), nBitmap), oPlace); });
    return nBitmap;
}

std::string TifDataset::GetBitmapDescription(unsigned int nBitmap) const
{
    if (const unsigned int nBeside = FindBeside(nBitmap))
        return GetSidecars().DescribeMask(nBeside);
    const PageSummary& oMask = GetMask(nBitmap, Place::Current());
    if (oMask.mbDescribed)
        return ReadPageMetadata(oMask.mnOffset).GetFileMetadataValue("ImageDescription");
    return oMask.mbMask ? std::string() : MakePageName(nBitmap, false);
}

void TifDataset::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("bitmaps cannot be written", oPlace);
    const unsigned int nMask = GetLevelBitmap();
    const std::uint64_t nPage = GetMask(nBitmap, oPlace).mnOffset;
    if (oDescription.find('\0') != std::string::npos)
        Refuse("a description with a NUL in it cannot be stored", oPlace);
    const std::vector<PageLevel> oLevels = GetPages().moMaskLevels;
    bool bOther = false;
    Edit(
        [&]
        {
            SetBitmapKind(*oEditor.GetPage(nPage), nBitmap, oDescription);
            ForgetPages();
            bOther = GetLevelBitmap() != nMask;
            for (const PageLevel& oLevel : oLevels)
                if (bOther)
                    oEditor.RemovePage(oLevel.moPage.mnOffset);
        });
    for (const PageLevel& oLevel : oLevels)
        if (bOther)
            moImages.erase({oLevel.moPage.mnOffset, PixelUse::eBitmap});
}

krv::datasources::MetadataMap TifDataset::GetBitmapMetadata(unsigned int nBitmap) const
{
    if (const unsigned int nBeside = FindBeside(nBitmap))
        return GetSidecars().GetMaskTags(nBeside);
    krv::datasources::MetadataMap oMap =
        ReadPageMetadata(GetMask(nBitmap, Place::Current()).mnOffset).GetFileMetadata();
    for (const char* pKey : MASK_KEYS)
        oMap.erase(pKey);
    return oMap;
}

void TifDataset::SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("bitmaps cannot be written", oPlace);
    const std::uint64_t nPage = GetMask(nBitmap, oPlace).mnOffset;
    krv::datasources::AuxiliaryData oRecord = ReadPageMetadata(nPage);
    krv::datasources::MetadataMap oMap = oMetadata;
    for (const char* pKey : MASK_KEYS)
        oMap[pKey] = oRecord.GetFileMetadataValue(pKey);
    oRecord.SetFileMetadata(oMap);
    Edit([&] { WriteMetadata(oEditor, oEditor.GetPage(nPage), oRecord, oPlace); });
}

krv::datasources::IOverviewManager* TifDataset::GetBitmapOverviewManager()
{
    if (GetLevelBitmap() == 0)
        return nullptr;
    return new support::OverviewManager(*this, *mpoMaskLevels);
}

} // namespace krv::plugins::tif
