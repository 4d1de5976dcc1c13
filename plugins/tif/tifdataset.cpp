#include "plugins/tif/tifdataset.h"

#include "plugins/tif/reading/pagesource.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>

namespace krv::plugins::tif
{

TifDataset::TifDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : Dataset(fileName, poFormat), mpoLevels(MakeLevels(PixelUse::eImage)), mpoMaskLevels(MakeLevels(PixelUse::eBitmap))
{
    const auto poFile = std::make_shared<support::File>(fileName, support::File::Mode::eRead);
    auto poReader = std::make_unique<PeekReader>(*poFile);
    FileHeader oHeader;
    const auto ReadRoot = [&]
    {
        oHeader = ReadHeader(*poReader);
        return oHeader.mnFirstDirectory;
    };
    support::HoldRoot(*poFile, ReadRoot);
    mpoFile = poFile;
    mpoPage = std::make_shared<Page>(mpoFile, oHeader, oHeader.mnFirstDirectory, std::move(poReader));
    SetImage(MakePageSource(mpoPage, PixelUse::eImage));
}

TifDataset::TifDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<FileEditor> poEditor)
    : Dataset(poFormat, poEditor), mpoLevels(MakeLevels(PixelUse::eImage)),
      mpoMaskLevels(MakeLevels(PixelUse::eBitmap)), mpoEditor(std::move(poEditor))
{
    if (mpoEditor->HasPages())
        OpenImage();
}

TifDataset::~TifDataset()
{
    Abandon();
}

void TifDataset::OpenImage()
{
    mpoFile = mpoEditor->GetFile();
    mpoPage = mpoEditor->OpenPage(mpoEditor->GetPages().front());
    ShowImage(MakeSource(mpoEditor->GetPages().front(), PixelUse::eImage));
}

void TifDataset::ShowImage(std::shared_ptr<support::IBlockSource> poSource)
{
    if (auto poWriter = std::dynamic_pointer_cast<PageWriter>(poSource))
        mpoImageWriter = poWriter;
    WatchImage();
    SetImage(std::move(poSource));
}

// Pages that are only read row by row stay so.
std::shared_ptr<support::IBlockSource> TifDataset::MakeSource(const std::shared_ptr<PageModel>& poModel, PixelUse eUse)
{
    std::shared_ptr<Page> poPage = mpoEditor->OpenPage(poModel);
    const PageForm& oForm = poPage->GetForm();
    if (!oForm.mbTiled && oForm.mnCompression != COMPRESSION_NONE &&
        StrileSource::GetStrileBytes(oForm) > StrileSource::MAXIMUM_STRILE_BYTES)
        return MakePageSource(std::move(poPage), eUse);
    const auto poWriter = std::make_shared<PageWriter>(mpoEditor, poModel, std::move(poPage), eUse);
    mpoEditor->Register(poWriter);
    moWriters[poModel->mnNumber] = poWriter;
    return poWriter;
}

FileEditor& TifDataset::GetEditor(const char* pWhat, const Place& oPlace) const
{
    CheckWriting(pWhat, oPlace);
    return *mpoEditor;
}

void TifDataset::ForgetPages() const
{
    moCodedPages.clear();
    mpoPages.reset();
    moBooks.clear();
    moGeocoding.reset();
}

// The image is opened again before the change counts: what readers would refuse is refused here.
void TifDataset::Edit(const std::function<void()>& oAction) const
{
    try
    {
        FileEditor::Operation oOperation(*mpoEditor);
        oAction();
        std::shared_ptr<Page> poPage = mpoEditor->OpenPage(mpoEditor->GetPages().front());
        oOperation.Adopt();
        mpoPage = std::move(poPage);
    }
    catch (...)
    {
        ForgetPages();
        throw;
    }
    ForgetPages();
}

// A page that was just made: what cannot be read, or is not taken for what it is to be, is refused.
void TifDataset::AddPage(const std::shared_ptr<PageModel>& poPage, const Place& oPlace)
{
    mpoEditor->AddPage(poPage);
    mpoEditor->OpenPage(poPage);
    ForgetPages();
    const PageTable& oTable = GetPages();
    const auto IsIt = [&poPage](const PageSummary& oPage)
    {
        return oPage.mnOffset == poPage->mnNumber;
    };
    const auto HasIt = [&IsIt](const std::vector<PageLevel>& oLevels)
    {
        return std::any_of(oLevels.begin(), oLevels.end(),
                           [&IsIt](const PageLevel& oLevel) { return IsIt(oLevel.moPage); });
    };
    if (!HasIt(oTable.moLevels) && !HasIt(oTable.moMaskLevels) &&
        std::none_of(oTable.moMasks.begin(), oTable.moMasks.end(), IsIt))
        Refuse("a level or a bitmap of such an image cannot be made", oPlace);
}

void TifDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    const Place oPlace = Place::Current();
    CheckCreate(nWidth, nHeight, oTypes, oPlace);
    if (oTypes.size() > UINT16_MAX)
        Refuse("TIFF holds at most 65535 channels", oPlace);
    for (const krv::gobs::DataType& oType : oTypes)
        if (oType != oTypes.front())
            Refuse("TIFF cannot mix the types " + oTypes.front().Describe() + " and " + oType.Describe() +
                       " in one image",
                   oPlace);
    oTypes.front().GetNativeCode(oPlace);
    if (oTypes.front().GetBits() < 8)
        Refuse("channels of single bits cannot be laid out; bitmaps can", oPlace);
    try
    {
        mpoEditor->AddFirstPage({nWidth, nHeight, static_cast<std::uint16_t>(oTypes.size()), oTypes.front()}, oPlace);
        OpenImage();
    }
    catch (...)
    {
        mpoPage.reset();
        mpoFile.reset();
        mpoEditor->Restart();
        throw;
    }
}

void TifDataset::Synchronize()
{
    Dataset::Synchronize();
    if (mpoEditor)
        WatchImage();
}

void TifDataset::Close()
{
    Dataset::Close();
    moImages.clear();
    moCodedPages.clear();
    mpoPage.reset();
    mpoFile.reset();
}

Page& TifDataset::GetPage(const Place& oPlace) const
{
    CheckOpen(oPlace);
    if (!mpoPage)
        Refuse("the dataset has no image yet", oPlace);
    return *mpoPage;
}

const TifDataset::PageTable& TifDataset::GetPages() const
{
    Page& oPage = GetPage();
    if (!mpoPages)
    {
        std::string trouble;
        const std::vector<PageSummary> oPages =
            mpoEditor ? mpoEditor->Summarise() : ListPages(oPage.GetReader(), oPage.GetHeader(), trouble);
        mpoPages = std::make_unique<PageTable>(
            PageTable{FindLevels(oPages), FindMasks(oPages), FindMaskLevels(oPages), tif::CountFurtherImages(oPages)});
        if (!trouble.empty())
            Complain("levels and masks are listed only as far as the chain of directories is sound: " + trouble);
        // Reduced masks of no mask are no levels of anything.
        if (mpoPages->moMasks.empty() || !mpoPages->moMasks.front().mbMask)
            mpoPages->moMaskLevels.clear();
    }
    return *mpoPages;
}

unsigned int TifDataset::CountFurtherImages() const
{
    return GetPages().mnFurtherImages;
}

const std::vector<PageLevel>& TifDataset::GetLevels(PixelUse eUse) const
{
    return eUse == PixelUse::eImage ? GetPages().moLevels : GetPages().moMaskLevels;
}

unsigned int TifDataset::GetLevelBitmap() const
{
    const std::vector<PageSummary>& oMasks = GetPages().moMasks;
    return oMasks.empty() || !oMasks.front().mbMask ? 0 : oMasks.front().mnNumber;
}

std::shared_ptr<support::BlockImage> TifDataset::OpenPage(std::uint64_t nDirectory, PixelUse eUse)
{
    CheckOpen();
    std::shared_ptr<support::BlockImage>& poImage = moImages[{nDirectory, eUse}];
    if (!poImage && mpoEditor)
        poImage = std::make_shared<support::BlockImage>(MakeSource(mpoEditor->GetPage(nDirectory), eUse), GetCache());
    else if (!poImage)
        poImage = std::make_shared<support::BlockImage>(
            MakePageSource(std::make_shared<Page>(mpoFile, mpoPage->GetHeader(), nDirectory), eUse), GetCache());
    return poImage;
}

void TifDataset::Complain(const std::string& trouble) const
{
    if (trouble.empty() || !moComplaints.insert(trouble).second)
        return;
    krv::nspio::Warning::Warn(mpoFile->GetName() + ": " + trouble);
}

// A file whose further pages are damaged can be read, and nobody knows what of it is used.
std::optional<std::uint64_t> TifDataset::GetUnusedBytes()
{
    CheckOpen();
    if (mpoEditor)
        return mpoEditor->GetUnusedBytes();
    try
    {
        return FileEditor::CountUnusedBytes(mpoFile, GetPage().GetHeader());
    }
    catch (const krv::FileException&)
    {
        return std::nullopt;
    }
}

} // namespace krv::plugins::tif
