// The blocks of a TIFF file as bytes: the facets IEncodedBlocks and IBlockEncoding of its dataset.
#include "datasources/metadata/levelbook.h"
#include "plugins/tif/reading/pagesource.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/blockencoder.h"
#include "plugins/tif/writing/encodedform.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::tif
{

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

std::shared_ptr<Page> TifDataset::GetCodedPage(unsigned int nLevel, const Place& oPlace)
{
    const std::uint64_t nPage = FindLevelPage(nLevel, oPlace);
    if (nLevel == 1)
        return mpoPage;
    std::shared_ptr<Page>& poPage = moCodedPages[nPage];
    if (!poPage)
        poPage = mpoEditor ? mpoEditor->OpenPage(mpoEditor->GetPage(nPage))
                           : std::make_shared<Page>(mpoFile, mpoPage->GetHeader(), nPage);
    return poPage;
}

krv::datasources::EncodedForm TifDataset::GetEncodedForm(unsigned int nLevel)
{
    return DescribeBlocks(*GetCodedPage(nLevel, Place::Current()));
}

bool TifDataset::KeepsPixels() const
{
    GetImage();
    return !DescribeBlocks(*mpoPage).mbLossy;
}

CodedStrile TifDataset::FindCoded(Page& oPage, const krv::datasources::BlockNumber& oBlock, const Place& oPlace) const
{
    const std::uint64_t nNumber = GetStrile(oPage, oBlock, oPlace);
    const Strile oStrile = oPage.GetStriles().Get(nNumber);
    const std::uint64_t nSize = oPage.GetFile().GetSize();
    if (oStrile.mnBytes != 0 && (oStrile.mnOffset > nSize || oStrile.mnBytes > nSize - oStrile.mnOffset))
        oPage.Fail("the file is truncated: block " + std::to_string(oBlock.mnColumn) + ", " +
                   std::to_string(oBlock.mnRow) + " reaches behind the end");
    const PageForm& oForm = oPage.GetForm();
    return {nNumber, oStrile.mnOffset,
            std::min<std::uint64_t>(oStrile.mnBytes, GetLargestCoded(oForm, oForm.GetStrileRows(oBlock.mnRow)))};
}

bool TifDataset::ReadEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock,
                             std::vector<unsigned char>& oBytes)
{
    const Place oPlace = Place::Current();
    Page& oPage = *GetCodedPage(nLevel, oPlace);
    if (mpoEditor)
        mpoEditor->StoreHeld();
    const CodedStrile oCoded = FindCoded(oPage, oBlock, oPlace);
    oBytes.resize(oCoded.mnBytes);
    if (!oBytes.empty())
        oPage.GetFile().Read(oCoded.mnOffset, oBytes.data(), oBytes.size());
    return !oBytes.empty();
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
    if (!poNew || !krv::datasources::IsLevelSize(GetWidth(), oForm.mnWidth, nLevel) ||
        !krv::datasources::IsLevelSize(GetHeight(), oForm.mnHeight, nLevel))
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

void TifDataset::StoreCoded(unsigned int nLevel, const std::function<void(PageWriter& oWriter)>& oStore,
                            const Place& oPlace)
{
    GetEditor("blocks cannot be written", oPlace);
    const std::uint64_t nNumber = FindLevelPage(nLevel, oPlace);
    support::BlockImage& oImage = nLevel == 1 ? *GetImage(oPlace) : *OpenPage(nNumber, PixelUse::eImage);
    const std::shared_ptr<PageWriter> poWriter = moWriters[nNumber].lock();
    if (!poWriter)
        Refuse("blocks of this image are only read", oPlace);
    oStore(*poWriter);
    oImage.DropBlocks();
}

void TifDataset::StoreEncoded(unsigned int nLevel, const krv::datasources::BlockNumber& oBlock,
                              const unsigned char* pBytes, std::size_t nBytes)
{
    const Place oPlace = Place::Current();
    GetEditor("blocks cannot be written", oPlace);
    const std::uint64_t nStrile = GetStrile(*GetCodedPage(nLevel, oPlace), oBlock, oPlace);
    if (pBytes == nullptr || nBytes == 0)
        Refuse("a block without bytes cannot be stored", oPlace);
    StoreCoded(
        nLevel, [&](PageWriter& oWriter) { oWriter.StoreCoded(nStrile, pBytes, nBytes); }, oPlace);
}

bool TifDataset::TakeBlocks(unsigned int nLevel, krv::datasources::IDataset& oSource,
                            const std::vector<krv::datasources::BlockNumber>& oBlocks)
{
    const Place oPlace = Place::Current();
    auto* const poSource = dynamic_cast<TifDataset*>(&oSource);
    if (poSource == nullptr || poSource == this)
        return false;
    if (poSource->mpoEditor)
        poSource->mpoEditor->StoreHeld();
    GetEditor("blocks cannot be written", oPlace);
    Page& oPage = *GetCodedPage(nLevel, oPlace);
    Page& oFrom = *poSource->GetCodedPage(nLevel, oPlace);
    std::vector<CodedStrile> oStriles;
    for (const krv::datasources::BlockNumber& oBlock : oBlocks)
    {
        const std::uint64_t nStrile = GetStrile(oPage, oBlock, oPlace);
        CodedStrile oCoded = poSource->FindCoded(oFrom, oBlock, oPlace);
        oCoded.mnNumber = nStrile;
        if (oCoded.mnBytes != 0)
            oStriles.push_back(oCoded);
    }
    if (!oStriles.empty())
        StoreCoded(
            nLevel, [&](PageWriter& oWriter) { oWriter.CopyCoded(oFrom.GetFile(), oStriles); }, oPlace);
    return true;
}

krv::datasources::IBlockEncoder* TifDataset::MakeBlockEncoder(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("blocks cannot be encoded", oPlace);
    oEditor.StoreHeld();
    const std::shared_ptr<Page> poPage = GetCodedPage(nLevel, oPlace);
    const auto& oCounts = oEditor.GetPage(FindLevelPage(nLevel, oPlace), oPlace)->moByteCounts;
    const auto oStored = std::find_if(oCounts.begin(), oCounts.end(), [](std::uint64_t nBytes) { return nBytes != 0; });
    std::vector<unsigned char> oLike;
    if (oStored != oCounts.end())
    {
        const Strile oStrile = poPage->GetStriles().Get(static_cast<std::uint64_t>(oStored - oCounts.begin()));
        oLike.resize(std::min<std::uint64_t>(oStrile.mnBytes, JpegEncoder::FORM_BYTES));
        oLike.resize(poPage->GetFile().ReadUpTo(oStrile.mnOffset, oLike.data(), oLike.size()));
    }
    return BlockEncoder::Make(poPage, oEditor.GetOptions().moLevel, std::move(oLike)).release();
}

} // namespace krv::plugins::tif
