// The reduced pages of a TIFF file as levels, and what changes of the image make of them.
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/levelbook.h"
#include "plugins/support/overviewmanager.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/metadatawriter.h"
#include "plugins/tif/writing/pagewriter.h"

#include <algorithm>

namespace krv::plugins::tif
{

// The reduced pages of the image, or of the mask that has some, as levels.
class TifDataset::Levels : public support::LevelStore
{
public:
    Levels(TifDataset& oDataset, PixelUse eUse) : moDataset(oDataset), meUse(eUse) {}

    std::vector<Level> GetLevels() const override
    {
        std::vector<Level> oLevels;
        for (const PageLevel& oLevel : moDataset.GetLevels(meUse))
            oLevels.push_back({oLevel.mnLevel, static_cast<unsigned int>(oLevel.moPage.mnWidth),
                               static_cast<unsigned int>(oLevel.moPage.mnHeight)});
        return oLevels;
    }

    std::shared_ptr<support::BlockImage> OpenLevel(unsigned int nLevel) override
    {
        return moDataset.OpenPage(Find(nLevel)->moPage.mnOffset, meUse);
    }

    // The name of a page made here is no metadata of its pixels.
    krv::datasources::AuxiliaryData ReadLevelRecord(unsigned int nLevel) override
    {
        const PageSummary& oPage = Find(nLevel)->moPage;
        krv::datasources::AuxiliaryData oData = moDataset.ReadPageMetadata(oPage.mnOffset);
        krv::datasources::MetadataMap oMap = oData.GetFileMetadata();
        if (oPage.mnNumber != 0 && oMap.erase("PageName") != 0)
            oData.SetFileMetadata(oMap);
        return oData;
    }

    // The pages of a bitmap have one channel, whatever its number.
    unsigned int FindChannel(unsigned int nChannel) const override
    {
        if (meUse == PixelUse::eBitmap)
            return nChannel != 0 && nChannel == moDataset.GetLevelBitmap() ? 1 : 0;
        return nChannel <= moDataset.GetChanCount() ? nChannel : 0;
    }

    const krv::datasources::AuxiliaryData& GetBook() const override { return moDataset.GetBook(meUse); }
    std::string& GetMethod() override { return moDataset.moResampling; }

    void MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override
    {
        FileEditor& oEditor = *moDataset.mpoEditor;
        const std::shared_ptr<PageModel> poFull = oEditor.GetPage(moDataset.GetFullPage(meUse));
        moDataset.Edit(
            [&]
            {
                oEditor.LoadTags(*poFull);
                const std::shared_ptr<PageModel> poLevel = MakeReducedPage(*poFull, oLevel.mnWidth, oLevel.mnHeight);
                poLevel->moTags.SetNumber(TIFFTAG_SUBFILETYPE, TIFF_LONG,
                                          FILETYPE_REDUCEDIMAGE | (meUse == PixelUse::eBitmap ? FILETYPE_MASK : 0));
                poLevel->moTags.SetText(TIFFTAG_PAGENAME, MakePageName(oLevel.mnNumber, true));
                moDataset.AddPage(poLevel, oPlace);
                WriteBook(oBook, false, oPlace);
            });
    }

    void DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override
    {
        std::vector<std::uint64_t> oGone;
        moDataset.Edit(
            [&]
            {
                // A smaller page of that number takes the place of the one that counted.
                while (const PageLevel* const pLevel = Find(nLevel))
                {
                    oGone.push_back(pLevel->moPage.mnOffset);
                    moDataset.mpoEditor->RemovePage(oGone.back());
                    moDataset.ForgetPages();
                }
                WriteBook(oBook, false, oPlace);
            });
        for (const std::uint64_t nPage : oGone)
            moDataset.moImages.erase({nPage, meUse});
    }

    void WriteBook(const krv::datasources::AuxiliaryData& oBook, bool bValid, const Place& oPlace) override
    {
        FileEditor& oEditor = *moDataset.mpoEditor;
        moDataset.Edit([&] { WriteMetadata(oEditor, oEditor.GetPage(moDataset.GetFullPage(meUse)), oBook, oPlace); });
        if (meUse == PixelUse::eImage && bValid)
            moDataset.WatchImage();
    }

private:
    const PageLevel* Find(unsigned int nLevel) const
    {
        const std::vector<PageLevel>& oLevels = moDataset.GetLevels(meUse);
        const auto oFound = std::find_if(oLevels.begin(), oLevels.end(),
                                         [nLevel](const PageLevel& oLevel) { return oLevel.mnLevel == nLevel; });
        return oFound == oLevels.end() ? nullptr : &*oFound;
    }

    TifDataset& moDataset;
    PixelUse meUse;
};

std::unique_ptr<support::LevelStore> TifDataset::MakeLevels(PixelUse eUse)
{
    return std::make_unique<Levels>(*this, eUse);
}

krv::datasources::IOverviewManager* TifDataset::GetOverviewManager()
{
    CheckOpen();
    return new support::OverviewManager(*this, *mpoLevels);
}

std::uint64_t TifDataset::GetFullPage(PixelUse eUse) const
{
    return eUse == PixelUse::eImage ? mpoEditor->GetPages().front()->mnNumber
                                    : GetMask(GetLevelBitmap(), Place::Current()).mnOffset;
}

const krv::datasources::AuxiliaryData& TifDataset::GetBook(PixelUse eUse) const
{
    const auto oFound = moBooks.find(eUse);
    if (oFound != moBooks.end())
        return oFound->second;
    krv::datasources::AuxiliaryData oBook =
        eUse == PixelUse::eImage ? ReadRecord()
                                 : ReadPageMetadata(GetMask(GetLevelBitmap(), Place::Current()).mnOffset);
    return moBooks[eUse] = std::move(oBook);
}

// The first change of the image's pixels makes its levels outdated, and what is recorded of their values. The record of
// a file that has no name yet is that of the pixels to come.
void TifDataset::WatchImage()
{
    if (const std::shared_ptr<PageWriter> poWriter = mpoImageWriter.lock())
        poWriter->OnChange([this] { ForgetOldPixels(); });
}

void TifDataset::ForgetOldPixels()
{
    ForgetPixelsBeside();
    krv::datasources::AuxiliaryData oBook = GetBook(PixelUse::eImage);
    const std::shared_ptr<PageModel> poModel = mpoEditor->GetPages().front();
    const bool bStatistics = mpoEditor->IsNamed() && krv::datasources::DropStatistics(oBook);
    const bool bRanges = mpoEditor->IsNamed() && poModel->HasRanges();
    const std::vector<PageLevel> oLevels = GetLevels(PixelUse::eImage);
    for (const PageLevel& oLevel : oLevels)
        SetLevelInvalid(oBook, oLevel.mnLevel);
    if (!bStatistics && !bRanges && oLevels.empty())
        return;
    Edit(
        [&]
        {
            if (bRanges)
                mpoEditor->GetPages().front()->DropRanges();
            WriteMetadata(*mpoEditor, mpoEditor->GetPages().front(), oBook, Place::Current());
        });
}

} // namespace krv::plugins::tif
