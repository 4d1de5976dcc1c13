// The blocks of a TIFF file as bytes: the facet IEncodedBlocks of its dataset.
#include "plugins/tif/reading/pagesource.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/encodedform.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::tif
{

namespace
{

std::uint64_t GetStrile(const PageForm& oForm, const krv::datasources::BlockNumber& oBlock, const Page& oPage,
                        const Place& oPlace)
{
    if (oBlock.mnPlane >= oForm.GetPlanes() || oBlock.mnColumn >= oForm.mnStrilesAcross ||
        oBlock.mnRow >= oForm.mnStrilesDown)
        throw DataException(oPage.GetFileName() + ": there is no block " + std::to_string(oBlock.mnColumn) + ", " +
                                std::to_string(oBlock.mnRow) + " of plane " + std::to_string(oBlock.mnPlane),
                            oPlace);
    return (std::uint64_t{oBlock.mnPlane} * oForm.mnStrilesDown + oBlock.mnRow) * oForm.mnStrilesAcross +
           oBlock.mnColumn;
}

// Whether the sides of an image and of its level are those of the level's number.
bool IsReduced(std::uint64_t nFull, std::uint64_t nReduced, unsigned int nLevel)
{
    const std::uint64_t nDown = nFull / nLevel;
    return nLevel == 1 ? nReduced == nFull : nReduced != 0 && nReduced <= nDown + 1 && nReduced + 1 >= nDown;
}

} // namespace

// By the editor's number, or for a file that is only read by its place; 0 for the image of such a file.
std::uint64_t TifDataset::FindLevelPage(unsigned int nLevel, const Place& oPlace) const
{
    CheckOpen(oPlace);
    GetPage(oPlace);
    if (nLevel == 1)
        return mpoEditor ? mpoEditor->GetPages().front()->mnNumber : 0;
    for (const PageLevel& oLevel : GetLevels(PixelUse::eImage))
        if (oLevel.mnLevel == nLevel)
            return oLevel.moPage.mnOffset;
    Refuse("level " + std::to_string(nLevel) + " does not exist", oPlace);
}

Page& TifDataset::GetCodedPage(unsigned int nLevel, const Place& oPlace)
{
    const std::uint64_t nPage = FindLevelPage(nLevel, oPlace);
    if (nLevel == 1)
        return *mpoPage;
    std::shared_ptr<Page>& poPage = moCodedPages[nPage];
    if (!poPage)
        poPage = mpoEditor ? mpoEditor->OpenPage(mpoEditor->GetPage(nPage))
                           : std::make_shared<Page>(mpoFile, mpoPage->GetHeader(), nPage);
    return *poPage;
}

krv::datasources::EncodedForm TifDataset::GetEncodedForm(unsigned int nLevel)
{
    return DescribeBlocks(GetCodedPage(nLevel, Place::Current()));
}

bool TifDataset::ReadEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock,
                             std::vector<unsigned char>& oBytes)
{
    const Place oPlace = Place::Current();
    Page& oPage = GetCodedPage(nLevel, oPlace);
    const PageForm& oForm = oPage.GetForm();
    if (mpoEditor)
        mpoEditor->StoreHeld();
    const Strile oStrile = oPage.GetStriles().Get(GetStrile(oForm, oBlock, oPage, oPlace));
    oBytes.clear();
    if (oStrile.mnBytes == 0)
        return false;
    const std::uint64_t nSize = oPage.GetFile().GetSize();
    if (oStrile.mnOffset > nSize || oStrile.mnBytes > nSize - oStrile.mnOffset)
        oPage.Fail("the file is truncated: block " + std::to_string(oBlock.mnColumn) + ", " +
                   std::to_string(oBlock.mnRow) + " reaches behind the end");
    oBytes.resize(std::min(oStrile.mnBytes, GetLargestCoded(oForm, oForm.GetStrileRows(oBlock.mnRow))));
    oPage.GetFile().Read(oStrile.mnOffset, oBytes.data(), oBytes.size());
    return true;
}

bool TifDataset::SetEncodedForm(unsigned int nLevel, const krv::datasources::EncodedForm& oForm)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("blocks cannot be laid out", oPlace);
    oEditor.StoreHeld();
    const std::uint64_t nNumber = FindLevelPage(nLevel, oPlace);
    const std::shared_ptr<PageModel> poOld = oEditor.GetPage(nNumber, oPlace);
    const auto& oCounts = poOld->moByteCounts;
    if (std::any_of(oCounts.begin(), oCounts.end(), [](std::uint64_t nBytes) { return nBytes != 0; }))
        Refuse("blocks are stored already", oPlace);
    oEditor.LoadTags(*poOld);
    const std::shared_ptr<PageModel> poNew = MakeEncodedPage(*poOld, oForm);
    if (!poNew || !IsReduced(GetWidth(), oForm.mnWidth, nLevel) || !IsReduced(GetHeight(), oForm.mnHeight, nLevel))
        return false;
    oEditor.LayOut(*poNew, oPlace);
    poNew->mnNumber = nNumber;
    try
    {
        // What libtiff or its codecs do not read, or read in another way, is no form to write.
        Edit(
            [&]
            {
                oEditor.ReplacePage(poNew);
                const std::shared_ptr<Page> poPage = oEditor.OpenPage(poNew);
                MakePageSource(poPage, PixelUse::eImage);
                if (DescribeBlocks(*poPage) != oForm)
                    poPage->Fail("the blocks would be of another form");
            });
    }
    catch (const FileFormatException&)
    {
        return false;
    }
    moImages.erase({nNumber, PixelUse::eImage});
    if (nLevel == 1)
        OpenImage();
    return true;
}

void TifDataset::StoreEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock,
                              const unsigned char* pBytes, std::size_t nBytes)
{
    const Place oPlace = Place::Current();
    GetEditor("blocks cannot be written", oPlace);
    const std::uint64_t nNumber = FindLevelPage(nLevel, oPlace);
    Page& oPage = GetCodedPage(nLevel, oPlace);
    const std::uint64_t nStrile = GetStrile(oPage.GetForm(), oBlock, oPage, oPlace);
    if (pBytes == nullptr || nBytes == 0)
        Refuse("a block without bytes cannot be stored", oPlace);
    support::BlockImage& oImage = nLevel == 1 ? *GetImage(oPlace) : *OpenPage(nNumber, PixelUse::eImage);
    const std::shared_ptr<PageWriter> poWriter = moWriters[nNumber].lock();
    if (!poWriter)
        Refuse("blocks of this image are only read", oPlace);
    poWriter->StoreCoded(nStrile, pBytes, nBytes);
    oImage.DropBlocks();
}

} // namespace krv::plugins::tif
