#include "plugins/tif/tifdataset.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/pixelstatistics.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/support/image/rasterio.h"
#include "plugins/support/image/stackedio.h"
#include "plugins/tif/geo/geokeys.h"
#include "plugins/tif/geo/geowriter.h"
#include "plugins/tif/reading/metadata.h"
#include "plugins/tif/reading/pagesource.h"
#include "plugins/tif/tifoverviewmanager.h"
#include "plugins/tif/writing/channeleditor.h"
#include "plugins/tif/writing/metadatawriter.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <cctype>
#include <climits>
#include <iterator>
#include <numeric>
#include <string_view>

namespace krv::plugins::tif
{

namespace
{

FileHeader ReadHeader(PeekReader& oReader)
{
    const support::File& oFile = oReader.GetFile();
    unsigned char aHeader[FileHeader::BYTES] = {};
    oReader.Forget();
    const std::size_t nBytes = oReader.Read(0, aHeader, sizeof(aHeader));
    const std::optional<FileHeader> oHeader = FileHeader::Parse(aHeader, nBytes);
    if (!oHeader)
        throw FileFormatException(oFile.GetName(), oFile.GetName() + ": is no TIFF file");
    return *oHeader;
}

const std::string VALID = "valid";
const std::string INVALID = "invalid";
// What of a mask page's record is not the bitmap's own.
constexpr const char* MASK_KEYS[] = {"ImageDescription", "Photometric", "PageName"};

// In which other programs say how they made the levels.
constexpr const char* FOREIGN_METHOD_KEY = "IMAGE_STRUCTURE:OVERVIEW_RESAMPLING";

std::string ToUpper(std::string text)
{
    for (char& nCharacter : text)
        nCharacter = static_cast<char>(std::toupper(static_cast<unsigned char>(nCharacter)));
    return text;
}

// name: in capitals.
bool IsResamplingName(std::string_view name)
{
    constexpr std::string_view NAMES[] = {"NEAREST", "AVERAGE", "MODE", "BILINEAR", "CUBIC",
                                          "LANCZOS", "RMS",     "MIN",  "MAX",      "NONE"};
    return std::find(std::begin(NAMES), std::end(NAMES), name) != std::end(NAMES);
}

std::string BookKey(unsigned int nLevel)
{
    return "_Overview_" + std::to_string(nLevel);
}

// Colours are of 16 bits; some writers store 8 bits, which shows in that none is above 255.
krv::gobs::PCT MakeTable(std::size_t nColours, const std::uint16_t* pRed, const std::uint16_t* pGreen,
                         const std::uint16_t* pBlue)
{
    const auto IsNarrow = [nColours](const std::uint16_t* pColours)
    {
        return std::all_of(pColours, pColours + nColours, [](std::uint16_t nColour) { return nColour < 256; });
    };
    const unsigned int nFactor = IsNarrow(pRed) && IsNarrow(pGreen) && IsNarrow(pBlue) ? 257 : 1;
    std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours(nColours);
    for (std::size_t nAt = 0; nAt < nColours; ++nAt)
        oColours[nAt] = {static_cast<std::uint16_t>(pRed[nAt] * nFactor),
                         static_cast<std::uint16_t>(pGreen[nAt] * nFactor),
                         static_cast<std::uint16_t>(pBlue[nAt] * nFactor)};
    return krv::gobs::PCT::FromColours(oColours);
}

} // namespace

// The other pages by what they are to the first one.
struct TifDataset::PageTable
{
    std::vector<PageLevel> moLevels;
    std::vector<PageSummary> moMasks;
    std::vector<PageLevel> moMaskLevels;
    unsigned int mnFurtherImages = 0;
};

TifDataset::TifDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : Dataset(fileName, poFormat)
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
    : Dataset(poEditor->GetFileName(), poFormat), mpoEditor(std::move(poEditor))
{
    if (mpoEditor->HasPages())
        OpenImage();
}

TifDataset::~TifDataset()
{
    if (mpoEditor && mpoEditor->HasUnsaved())
        WarnOfLoss();
    if (mpoEditor)
        mpoEditor->Discard();
}

void TifDataset::OpenImage()
{
    mpoFile = mpoEditor->GetFile();
    mpoPage = mpoEditor->OpenPage(mpoEditor->GetPages().front());
    ShowImage(MakeSource(mpoEditor->GetPages().front(), PixelUse::eImage));
}

void TifDataset::ShowImage(std::unique_ptr<support::IBlockSource> poSource)
{
    if (const auto* poEdited = dynamic_cast<const EditedSource*>(poSource.get()))
        mpoImageWriter = poEdited->GetWriter();
    WatchImage();
    SetImage(std::move(poSource));
}

// Pages that are only read row by row stay so.
std::unique_ptr<support::IBlockSource> TifDataset::MakeSource(const std::shared_ptr<PageModel>& poModel, PixelUse eUse)
{
    std::shared_ptr<Page> poPage = mpoEditor->OpenPage(poModel);
    const PageForm& oForm = poPage->GetForm();
    if (!oForm.mbTiled && oForm.mnCompression != COMPRESSION_NONE &&
        StrileSource::GetStrileBytes(oForm) > StrileSource::MAXIMUM_STRILE_BYTES)
        return MakePageSource(std::move(poPage), eUse);
    const auto poWriter = std::make_shared<PageWriter>(mpoEditor, poModel, std::move(poPage), eUse);
    mpoEditor->Register(poWriter);
    moWriters[poModel->mnNumber] = poWriter;
    return std::make_unique<EditedSource>(poWriter);
}

FileEditor& TifDataset::GetEditor(const char* pWhat, const Place& oPlace) const
{
    CheckOpen(oPlace);
    if (!mpoEditor)
        Refuse(std::string("the file is open for reading only: ") + pWhat, oPlace);
    if (!mpoEditor->HasPages())
        Refuse("the dataset has no image yet", oPlace);
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
    CheckOpen(oPlace);
    if (!mpoEditor || HasImage())
        Refuse("an image exists already", oPlace);
    if (nWidth == 0 || nHeight == 0 || nWidth > INT_MAX || nHeight > INT_MAX || oTypes.empty())
        Refuse("an image of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) + " pixels and " +
                   std::to_string(oTypes.size()) + " channels cannot be laid out",
               oPlace);
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

bool TifDataset::Exists() const
{
    return mpoEditor && !mpoEditor->IsNamed() ? mpoEditor->HasPages() : Dataset::Exists();
}

krv::datasources::FileAccessState TifDataset::Delete()
{
    const bool bNamed = !mpoEditor || mpoEditor->IsNamed();
    if (mpoEditor)
        mpoEditor->Discard();
    if (bNamed)
        return Dataset::Delete();
    Close();
    return krv::datasources::eDone;
}

void TifDataset::KeepExisting()
{
    if (mpoEditor)
        mpoEditor->KeepExisting();
}

void TifDataset::Synchronize()
{
    CheckOpen();
    if (!mpoEditor)
        return;
    mpoEditor->Synchronize();
    WatchImage();
}

krv::datasources::AccessCapabilities TifDataset::GetRasterCapabilities()
{
    return {true, mpoEditor != nullptr, mpoEditor != nullptr};
}

void TifDataset::Close()
{
    if (mpoEditor && !mpoEditor->IsEnded())
    {
        mpoEditor->Finish();
        mpoEditor->End();
    }
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

krv::datasources::AuxiliaryData TifDataset::ReadPageMetadata(std::uint64_t nDirectory) const
{
    if (mpoEditor)
        return ReadMetadata(*mpoEditor->OpenPage(mpoEditor->GetPage(nDirectory)));
    Page oPage(mpoFile, GetPage().GetHeader(), nDirectory);
    return ReadMetadata(oPage);
}

krv::datasources::AuxiliaryData TifDataset::ReadAuxiliaryData()
{
    return ReadRecord();
}

krv::datasources::AuxiliaryData TifDataset::ReadRecord() const
{
    std::string trouble;
    krv::datasources::AuxiliaryData oRecord = ReadMetadata(GetPage(), &trouble);
    Complain(trouble);
    return oRecord;
}

void TifDataset::Complain(const std::string& trouble) const
{
    if (trouble.empty() || !moComplaints.insert(trouble).second)
        return;
    krv::nspio::Warning::Warn(mpoFile->GetName() + ": " + trouble, "plugins/tif/tifdataset", __LINE__);
}

void TifDataset::WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("metadata cannot be written", oPlace);
    krv::datasources::AuxiliaryData oRecord = oData;
    const krv::datasources::AuxiliaryData oBook = GetBook(PixelUse::eImage);
    for (const PageLevel& oLevel : GetLevels(PixelUse::eImage))
        for (unsigned int nChannel = 1; nChannel <= std::min(oData.GetChannelCount(), GetChanCount()); ++nChannel)
            oRecord.SetChanMetadataValue(BookKey(oLevel.mnLevel),
                                         oBook.GetChanMetadataValue(BookKey(oLevel.mnLevel), nChannel), nChannel);
    Edit([&] { MetadataWriter(oEditor, oEditor.GetPages().front()).Write(oRecord, oPlace); });
    WatchImage();
}

void TifDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("the reference system cannot be written", oPlace);
    Edit(
        [&]
        {
            oEditor.LoadTags(*oEditor.GetPages().front());
            GeoWriter(oEditor, oEditor.GetPages().front()).SetCRS(oCRS, oPlace);
        });
}

void TifDataset::AddNewChannel(const krv::gobs::RasterInfo& oInfo)
{
    const Place oPlace = Place::Current();
    GetEditor("channels cannot be added", oPlace);
    if (oInfo.GetWidth() != GetWidth() || oInfo.GetHeight() != GetHeight())
        Refuse("a channel of another size cannot be added", oPlace);
    const krv::gobs::DataType oType = GetLayout().GetPlane(0).moType;
    if (oInfo.GetDataType() != oType || mpoPage->GetForm().moSample.meWidening != Widening::eNone)
        Refuse("TIFF cannot mix the types " + oType.Describe() + " and " + oInfo.GetDataType().Describe() +
                   " in one image",
               oPlace);
    if (std::uint64_t{GetChanCount()} + oInfo.GetChansCount() > UINT16_MAX)
        Refuse("TIFF holds at most 65535 channels", oPlace);
    std::vector<unsigned int> oSources(GetChanCount());
    std::iota(oSources.begin(), oSources.end(), 1u);
    oSources.resize(oSources.size() + oInfo.GetChansCount(), 0);
    ChangeChannels(oSources, oPlace);
}

void TifDataset::DeleteChannel(unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    GetEditor("channels cannot be deleted", oPlace);
    if (nChannel == 0 || nChannel > GetChanCount())
        Refuse("channel " + std::to_string(nChannel) + " does not exist", oPlace);
    if (GetChanCount() == 1)
        Refuse("the only channel cannot be deleted", oPlace);
    if (mpoPage->GetForm().moSample.meWidening != Widening::eNone)
        Refuse("channels of this kind cannot be deleted", oPlace);
    std::vector<unsigned int> oSources(GetChanCount());
    std::iota(oSources.begin(), oSources.end(), 1u);
    oSources.erase(oSources.begin() + (nChannel - 1));
    ChangeChannels(oSources, oPlace);
}

// The record is taken off the old channels and put on the new ones.
void TifDataset::ChangeChannels(const std::vector<unsigned int>& oSources, const Place& oPlace)
{
    FileEditor& oEditor = *mpoEditor;
    oEditor.StoreHeld();
    const krv::datasources::AuxiliaryData oOld = ReadAuxiliaryData();
    krv::datasources::AuxiliaryData oBare(oOld.GetChannelCount());
    oBare.SetFileMetadata(oOld.GetFileMetadata());
    krv::datasources::AuxiliaryData oNew(static_cast<unsigned int>(oSources.size()));
    oNew.SetFileMetadata(oOld.GetFileMetadata());
    for (unsigned int nAt = 0; nAt < oSources.size(); ++nAt)
        if (oSources[nAt] != 0)
        {
            oNew.SetChanMetadata(oOld.GetChanMetadata(oSources[nAt]), nAt + 1);
            oNew.SetChannelDescription(oOld.GetChannelDescription(oSources[nAt]), nAt + 1);
        }
        else
            for (const PageLevel& oLevel : GetLevels(PixelUse::eImage))
                oNew.SetChanMetadataValue(BookKey(oLevel.mnLevel), INVALID, nAt + 1);
    std::vector<std::uint64_t> oNumbers = {oEditor.GetPages().front()->mnNumber};
    for (const PageLevel& oLevel : GetLevels(PixelUse::eImage))
        oNumbers.push_back(oLevel.moPage.mnOffset);
    const ChannelEditor oChannels(oEditor, oSources);
    std::unique_ptr<support::IBlockSource> poSource;
    Edit(
        [&]
        {
            MetadataWriter(oEditor, oEditor.GetPages().front()).Write(oBare, oPlace);
            for (const std::uint64_t nNumber : oNumbers)
                oChannels.Rebuild(oEditor.GetPage(nNumber), oPlace);
            MetadataWriter(oEditor, oEditor.GetPages().front()).Write(oNew, oPlace);
            poSource = MakeSource(oEditor.GetPages().front(), PixelUse::eImage);
        });
    moImages.clear();
    ShowImage(std::move(poSource));
}

krv::ogc::cs::ICRS* TifDataset::ReadCRS() const
{
    std::string trouble;
    std::unique_ptr<krv::ogc::cs::ICRS> poCRS = tif::ReadCRS(GetPage().GetTiff(), &trouble);
    Complain(trouble);
    return poCRS.release();
}

krv::datasources::IOverviewManager* TifDataset::GetOverviewManager()
{
    CheckOpen();
    return new TifOverviewManager(*this, PixelUse::eImage);
}

const krv::ogc::cs::GeocodingInfo& TifDataset::GetGeocoding() const
{
    if (!moGeocoding)
    {
        krv::ogc::cs::GeocodingInfo oInfo;
        ReadGeocoding(GetPage().GetTiff(), oInfo);
        moGeocoding = oInfo;
    }
    return *moGeocoding;
}

void TifDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("the geocoding cannot be written", oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    Edit(
        [&]
        {
            oEditor.LoadTags(*oEditor.GetPages().front());
            GeoWriter(oEditor, oEditor.GetPages().front()).SetGeocoding(oInfo);
        });
}

std::vector<unsigned int> TifDataset::GetBitmapList() const
{
    std::vector<unsigned int> oList;
    for (const PageSummary& oMask : GetPages().moMasks)
        oList.push_back(oMask.mnNumber);
    std::sort(oList.begin(), oList.end());
    return oList;
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
        oParts.push_back(std::make_unique<support::RasterIO>(
            OpenPage(GetMask(nBitmap, Place::Current()).mnOffset, PixelUse::eBitmap), std::vector<unsigned int>{1}));
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
    const std::vector<unsigned int> oList = GetBitmapList();
    if (!oList.empty() && oList.back() == UINT_MAX)
        Refuse("the numbers of bitmaps are used up", oPlace);
    const unsigned int nBitmap = oList.empty() ? 1 : oList.back() + 1;
    Edit([&] { AddPage(MakeBitmapPage(*oEditor.GetPages().front(), nBitmap), oPlace); });
    return nBitmap;
}

std::string TifDataset::GetBitmapDescription(unsigned int nBitmap) const
{
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
    Edit([&] { MetadataWriter(oEditor, oEditor.GetPage(nPage)).Write(oRecord, oPlace); });
}

krv::datasources::IOverviewManager* TifDataset::GetBitmapOverviewManager()
{
    if (GetLevelBitmap() == 0)
        return nullptr;
    return new TifOverviewManager(*this, PixelUse::eBitmap);
}

std::vector<unsigned int> TifDataset::GetPCTList() const
{
    const PageForm& oForm = GetPage().GetForm();
    std::uint16_t* pColours = nullptr;
    const bool bTable = oForm.mnPhotometric == PHOTOMETRIC_PALETTE && oForm.moSample.GetBits() <= 16 &&
                        TIFFGetField(mpoPage->GetTiff(), TIFFTAG_COLORMAP, &pColours, &pColours, &pColours) == 1;
    return bTable ? std::vector<unsigned int>{1} : std::vector<unsigned int>{};
}

void TifDataset::CheckPCT(unsigned int nPCT, const Place& oPlace) const
{
    if (nPCT != 1 || GetPCTList().empty())
        Refuse("pseudocolour table " + std::to_string(nPCT) + " does not exist", oPlace);
}

krv::gobs::PCT* TifDataset::GetPCT(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    std::uint16_t* pRed = nullptr;
    std::uint16_t* pGreen = nullptr;
    std::uint16_t* pBlue = nullptr;
    TIFFGetField(mpoPage->GetTiff(), TIFFTAG_COLORMAP, &pRed, &pGreen, &pBlue);
    const std::size_t nColours = std::size_t{1} << mpoPage->GetForm().moSample.GetBits();
    return new krv::gobs::PCT(MakeTable(nColours, pRed, pGreen, pBlue));
}

unsigned int TifDataset::GetPCTChannel(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return 1;
}

std::string TifDataset::GetPCTDescription(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return {};
}

unsigned int TifDataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    GetEditor("pseudocolour tables cannot be written", oPlace);
    if (nChannel > 1 || !GetPCTList().empty())
        Refuse("TIFF holds one pseudocolour table, for channel 1", oPlace);
    StorePCT(oTable, oPlace);
    return 1;
}

void TifDataset::StorePCT(const krv::gobs::PCT& oTable, const Place& oPlace)
{
    const PageForm& oForm = GetPage(oPlace).GetForm();
    const SampleForm& oSample = oForm.moSample;
    const bool bIndex = oForm.mnChannels == 1 && oSample.mnParts == 1 && !oSample.IsSigned() &&
                        !oSample.moNativeType.IsReal() && oSample.GetBits() <= 16;
    if (!bIndex)
        Refuse("only a single channel of 8U or 16U can have a pseudocolour table", oPlace);
    const std::size_t nColours = std::size_t{1} << oSample.GetBits();
    std::vector<std::uint64_t> oColours(3 * nColours);
    for (std::size_t nAt = 0; nAt < nColours; ++nAt)
    {
        std::uint16_t nAlpha = 0;
        const krv::gobs::RGBTuple<std::uint16_t> oColour = oTable.GetValue16(static_cast<double>(nAt), nAlpha);
        oColours[nAt] = oColour.red;
        oColours[nColours + nAt] = oColour.green;
        oColours[2 * nColours + nAt] = oColour.blue;
    }
    Edit(
        [&]
        {
            TagList& oTags = mpoEditor->GetPages().front()->moTags;
            oTags.SetNumbers(TIFFTAG_COLORMAP, TIFF_SHORT, oColours);
            oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, PHOTOMETRIC_PALETTE);
            // Readers size the table by it, and take none for granted.
            oTags.SetNumber(TIFFTAG_BITSPERSAMPLE, TIFF_SHORT, oSample.GetBits());
        });
}

void TifDataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    const Place oPlace = Place::Current();
    GetEditor("pseudocolour tables cannot be written", oPlace);
    CheckPCT(nPCT, oPlace);
    StorePCT(oTable, oPlace);
}

void TifDataset::SetPCTDescription(unsigned int, const std::string&)
{
    Refuse("TIFF has no place for the description of a pseudocolour table");
}

void TifDataset::DeletePCT(unsigned int nPCT)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("pseudocolour tables cannot be deleted", oPlace);
    CheckPCT(nPCT, oPlace);
    TagList& oTags = oEditor.GetPages().front()->moTags;
    Edit(
        [&oTags]
        {
            oTags.Remove(TIFFTAG_COLORMAP);
            oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, PHOTOMETRIC_MINISBLACK);
        });
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

void TifDataset::WriteBook(const krv::datasources::AuxiliaryData& oBook, PixelUse eUse, const Place& oPlace)
{
    Edit([&] { MetadataWriter(*mpoEditor, mpoEditor->GetPage(GetFullPage(eUse))).Write(oBook, oPlace); });
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

void TifDataset::CreateLevel(unsigned int nLevel, PixelUse eUse, const Place& oPlace)
{
    FileEditor& oEditor = GetEditor("overviews cannot be written", oPlace);
    for (const PageLevel& oLevel : GetLevels(eUse))
        if (oLevel.mnLevel == nLevel)
            Refuse("level " + std::to_string(nLevel) + " exists already", oPlace);
    if (nLevel < 2 || (GetWidth() == 1 && GetHeight() == 1))
        Refuse("there is no level " + std::to_string(nLevel) + " of such an image", oPlace);
    const std::shared_ptr<PageModel> poFull = oEditor.GetPage(GetFullPage(eUse));
    krv::datasources::AuxiliaryData oBook = GetBook(eUse);
    for (unsigned int nChannel = 1; nChannel <= oBook.GetChannelCount(); ++nChannel)
        oBook.SetChanMetadataValue(BookKey(nLevel), INVALID, nChannel);
    Edit(
        [&]
        {
            oEditor.LoadTags(*poFull);
            const std::shared_ptr<PageModel> poLevel =
                MakeReducedPage(*poFull, (GetWidth() - 1) / nLevel + 1, (GetHeight() - 1) / nLevel + 1);
            poLevel->moTags.SetNumber(TIFFTAG_SUBFILETYPE, TIFF_LONG,
                                      FILETYPE_REDUCEDIMAGE | (eUse == PixelUse::eBitmap ? FILETYPE_MASK : 0));
            poLevel->moTags.SetText(TIFFTAG_PAGENAME, MakePageName(nLevel, true));
            AddPage(poLevel, oPlace);
            WriteBook(oBook, eUse, oPlace);
        });
}

void TifDataset::DeleteLevel(unsigned int nLevel, PixelUse eUse, const Place& oPlace)
{
    FileEditor& oEditor = GetEditor("overviews cannot be deleted", oPlace);
    krv::datasources::AuxiliaryData oBook = GetBook(eUse);
    for (unsigned int nChannel = 1; nChannel <= oBook.GetChannelCount(); ++nChannel)
        oBook.RemoveChanMetadataValue(BookKey(nLevel), nChannel);
    std::vector<std::uint64_t> oGone;
    Edit(
        [&]
        {
            // A smaller page of that number takes the place of the one that counted.
            const auto HasNumber = [nLevel](const PageLevel& oLevel)
            {
                return oLevel.mnLevel == nLevel;
            };
            for (;;)
            {
                const std::vector<PageLevel>& oLevels = GetLevels(eUse);
                const auto oFound = std::find_if(oLevels.begin(), oLevels.end(), HasNumber);
                if (oFound == oLevels.end())
                    break;
                oGone.push_back(oFound->moPage.mnOffset);
                oEditor.RemovePage(oGone.back());
                ForgetPages();
            }
            WriteBook(oBook, eUse, oPlace);
        });
    for (const std::uint64_t nPage : oGone)
        moImages.erase({nPage, eUse});
}

bool TifDataset::IsLevelValid(unsigned int nChannel, unsigned int nLevel, PixelUse eUse) const
{
    return !GetBook(eUse).GetChanMetadataValue(BookKey(nLevel), nChannel).starts_with(INVALID);
}

void TifDataset::SetLevelValid(unsigned int nChannel, unsigned int nLevel, bool bValid, PixelUse eUse,
                               const Place& oPlace)
{
    GetEditor("overviews cannot be written", oPlace);
    krv::datasources::AuxiliaryData oBook = GetBook(eUse);
    const std::string method = moResampling.empty() ? std::string() : " " + moResampling;
    oBook.SetChanMetadataValue(BookKey(nLevel), (bValid ? VALID : INVALID) + method, nChannel);
    if (!moResampling.empty() && !oBook.GetFileMetadataValue(FOREIGN_METHOD_KEY).empty())
        oBook.SetFileMetadataValue(FOREIGN_METHOD_KEY, moResampling);
    WriteBook(oBook, eUse, oPlace);
    if (eUse == PixelUse::eImage && bValid)
        WatchImage();
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
    krv::datasources::AuxiliaryData oBook = GetBook(PixelUse::eImage);
    const std::shared_ptr<PageModel> poModel = mpoEditor->GetPages().front();
    const bool bStatistics = mpoEditor->IsNamed() && krv::datasources::DropStatistics(oBook);
    const bool bRanges = mpoEditor->IsNamed() && poModel->HasRanges();
    const std::vector<PageLevel> oLevels = GetLevels(PixelUse::eImage);
    for (const PageLevel& oLevel : oLevels)
        for (unsigned int nChannel = 1; nChannel <= oBook.GetChannelCount(); ++nChannel)
            oBook.SetChanMetadataValue(BookKey(oLevel.mnLevel), INVALID, nChannel);
    if (!bStatistics && !bRanges && oLevels.empty())
        return;
    Edit(
        [&]
        {
            if (bRanges)
                mpoEditor->GetPages().front()->DropRanges();
            MetadataWriter(*mpoEditor, mpoEditor->GetPages().front()).Write(oBook, Place::Current());
        });
}

std::string TifDataset::GetResamplingName(PixelUse eUse) const
{
    if (!moResampling.empty() || GetLevels(eUse).empty())
        return moResampling;
    const krv::datasources::AuxiliaryData& oBook = GetBook(eUse);
    const std::string state = oBook.GetChanMetadataValue(BookKey(GetLevels(eUse).front().mnLevel), 1);
    const std::size_t nBlank = state.find(' ');
    if (nBlank != std::string::npos)
        return state.substr(nBlank + 1);
    const std::string method = ToUpper(oBook.GetFileMetadataValue(FOREIGN_METHOD_KEY));
    return IsResamplingName(method) ? method : std::string();
}

void TifDataset::SetResamplingName(const std::string& name, const Place& oPlace)
{
    GetEditor("overviews cannot be written", oPlace);
    const std::string upper = ToUpper(name);
    if (!IsResamplingName(upper))
        throw ParameterException("The resampling method " + name + " is not known", ParameterException::eInvalidValue,
                                 "name", oPlace);
    moResampling = upper;
}

} // namespace krv::plugins::tif
