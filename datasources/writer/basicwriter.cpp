#include "datasources/writer/basicwriter.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelfilter.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/writer/basicoverviewwriteraccessor.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/described.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::datasources
{

namespace
{

using detail::RequireFacet;

std::string FormatName(const IDataset& oDataset)
{
    const IFileFormat* const poFormat = oDataset.GetFileFormat();
    return poFormat != nullptr ? poFormat->GetShortName() : std::string();
}

void Require(bool bCondition, const char* pMessage, const Place& oPlace)
{
    if (!bCondition)
        throw krv::DataException(pMessage, oPlace);
}

} // namespace

BasicWriter::BasicWriter() = default;

BasicWriter::BasicWriter(const std::string& fileName)
{
    UseFile(fileName, Place::Current());
}

BasicWriter::BasicWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels)
{
    UseRasterDataset(RDSIf(fileName), oChannels, true, Place::Current());
}

BasicWriter::BasicWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                         const std::string& format, const std::string& options)
{
    UseFileOrNew(fileName, oChannels, format, options, Place::Current());
}

BasicWriter::BasicWriter(const std::string& fileName, const IChannelFilter& oFilter)
{
    UseFile(fileName, oFilter, Place::Current());
}

BasicWriter::BasicWriter(IBitmapDataset* poDataset, const std::vector<unsigned int>& oBitmaps)
{
    const Place oPlace = Place::Current();
    Require(!oBitmaps.empty(), "You should request at least one channel.", oPlace);
    auto* const poRoot = dynamic_cast<IDataset*>(poDataset);
    Require(poRoot != nullptr, "Invalid bitmap Dataset", oPlace);
    mpoChannels->SetBitmaps();
    SetDataset(poRoot, oBitmaps, false);
    if (poRoot->Exists())
        OpenDatasetOrCleanup(true);
}

BasicWriter::BasicWriter(IRasterDataset* poDataset, const std::vector<unsigned int>& oChannels)
{
    UseRasterDataset(poDataset, oChannels, false, Place::Current());
}

BasicWriter::BasicWriter(IRasterDataset* poDataset, IRasterIO* poRasterIO, const std::vector<unsigned int>& oChannels)
{
    std::unique_ptr<IRasterIO> oRasterIO(poRasterIO);
    const Place oPlace = Place::Current();
    Require(!oChannels.empty(), "Channel list can not be empty", oPlace);
    Require(poDataset != nullptr, "Invalid Raster Dataset, poRDS can not be NULL", oPlace);
    Require(oRasterIO != nullptr, "Invalid Raster IO, poRasterIO can not be NULL", oPlace);
    auto* const poRoot = dynamic_cast<IDataset*>(poDataset);
    Require(poRoot != nullptr, "poRDS is not an IDataset", oPlace);

    const std::unique_ptr<IChannelInfo> oFirst(poDataset->GetChannelInfo(oChannels.front()));
    Require(oFirst != nullptr, "The dataset gave no description of the first channel", oPlace);
    Commit(detail::OpenRasterIO(std::move(oRasterIO), oFirst->GetDataType(), oPlace));
    SetDataset(poRoot, oChannels, false);
}

BasicWriter::~BasicWriter() = default;

IDataset& BasicWriter::UseNamed(IDataset* poDataset, const std::string& fileName,
                                const std::vector<unsigned int>& oChannels, const Place& oPlace)
{
    SetDataset(poDataset, oChannels, true);
    if (poDataset == nullptr)
        throw krv::DataException("Unrecognized format: file=" + fileName, oPlace);
    RequireFacet<IRasterDataset>(poDataset, "Format does not support rasters: file=" + fileName, oPlace);
    return *poDataset;
}

void BasicWriter::UseFile(const std::string& fileName, const Place& oPlace)
{
    const IRasterDataset& oRasterDataset =
        OpenFile(fileName, "Cannot open file for writing when it does not exist", oPlace);
    mpoChannels->SetChannels(detail::AllChannels(oRasterDataset));
    OpenDatasetOrCleanup(false);
}

void BasicWriter::UseFile(const std::string& fileName, const IChannelFilter& oFilter, const Place& oPlace)
{
    // "Can not" and the other form's "Cannot" both stand, intended: callers tell the two by it.
    const IRasterDataset& oRasterDataset =
        OpenFile(fileName, "Can not open file for writing when it does not exist", oPlace);
    mpoChannels->SetChannels(oFilter.Accept(oRasterDataset));
    OpenDatasetOrCleanup(false);
}

void BasicWriter::UseFileOrNew(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                               const std::string& format, const std::string& options, const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException("No channels in dataset: file=" + fileName, oPlace);
    DatasetManager& oManager = *DatasetManager::GetInstance();
    const bool bThere = krv::core::fileio::File(fileName).Exists();
    IDataset& oDataset =
        UseNamed(bThere ? oManager.Open(fileName, eUpdate) : oManager.NewDataset(fileName, format, options), fileName,
                 oChannels, oPlace);
    auto* const poNewFile = dynamic_cast<INewFileDataset*>(&oDataset);
    if (!bThere && poNewFile != nullptr)
        poNewFile->KeepExisting();
    if (oDataset.Exists())
        OpenDatasetOrCleanup(false);
}

// Opens a file whose image must be there already, and owns it from then on.
IRasterDataset& BasicWriter::OpenFile(const std::string& fileName, const char* pMissing, const Place& oPlace)
{
    SetDataset(DatasetManager::GetInstance()->Open(fileName, eUpdate), {}, true);
    if (GetDataset() != nullptr && !GetDataset()->Exists())
        throw krv::FileNotFoundException(fileName, pMissing, oPlace);
    return RequireFacet<IRasterDataset>(GetDataset(), "Format does not support rasters: file=" + fileName, oPlace);
}

void BasicWriter::UseRasterDataset(IRasterDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bOwn,
                                   const Place& oPlace)
{
    auto* const poRoot = dynamic_cast<IDataset*>(poDataset);
    Require(poRoot != nullptr, "Invalid Raster Dataset", oPlace);
    SetDataset(poRoot, oChannels, bOwn);
    if (poRoot->Exists())
        OpenDatasetOrCleanup(false);
}

IRasterDataset* BasicWriter::RDSIf(const std::string& fileName)
{
    std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->Open(fileName, eUpdate));
    auto* const poRasterDataset = dynamic_cast<IRasterDataset*>(oDataset.get());
    if (poRasterDataset == nullptr)
        return nullptr;
    static_cast<void>(oDataset.release());
    return poRasterDataset;
}

void BasicWriter::Init()
{
    Commit(detail::OpenedChannels());
    KeepMargins(0, 0, eMirror);
}

void BasicWriter::OpenDataset(bool bBitmaps)
{
    const Place oPlace = Place::Current();
    IDataset* const poDataset = GetDataset();
    std::vector<unsigned int> oChannels = GetChannels();
    detail::OpenedChannels oOpened;
    if (bBitmaps)
    {
        auto& oBitmaps = RequireFacet<IBitmapDataset>(
            poDataset, "Format does not support bitmaps: format=" + FormatName(*poDataset), oPlace);
        if (oChannels.empty())
            oChannels = oBitmaps.GetBitmapList();
        Require(!oChannels.empty(), "No bitmap selected to write", oPlace);
        oOpened = detail::OpenBitmaps(oBitmaps, oChannels, oPlace);
    }
    else
    {
        auto& oRasterDataset = RequireFacet<IRasterDataset>(
            poDataset, "Format does not support rasters: format=" + FormatName(*poDataset), oPlace);
        if (oChannels.empty())
            oChannels = detail::AllChannels(oRasterDataset);
        Require(!oChannels.empty(), "No channels selected to write", oPlace);
        oOpened = MakeChannels(oRasterDataset, oChannels, oPlace); // virtual: a derived writer may open otherwise
    }
    Commit(std::move(oOpened));
    mpoChannels->SetChannels(std::move(oChannels));
    SetOptimalTileSize(); // virtual: a derived writer may choose its own
}

void BasicWriter::OpenDatasetOrCleanup(bool bBitmaps)
{
    try
    {
        OpenDataset(bBitmaps);
    }
    catch (...)
    {
        CleanupDataset();
        throw;
    }
}

void BasicWriter::CleanupDataset()
{
    Commit(detail::OpenedChannels());
    mpoChannels->DropOwnedDataset();
}

void BasicWriter::LazyOpen()
{
    if (!mpoChannels->IsOpen())
        OpenDataset(false);
}

// A dataset that is still to be created gets the plain message instead of what its opening says.
void BasicWriter::OpenForWriting()
{
    try
    {
        LazyOpen();
    }
    catch (const krv::Exception&)
    {
        if (GetDataset()->Exists())
            throw;
    }
}

krv::gobs::Raster* BasicWriter::GetRaster(unsigned int nIndex)
{
    LazyOpen();
    return RasterAccess::GetRaster(nIndex);
}

krv::gobs::Raster* BasicWriter::ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
{
    LazyOpen();
    return RasterAccess::ReadRaster(nX, nY, nWidth, nHeight);
}

void BasicWriter::ReadRaster(krv::gobs::Raster* poRaster)
{
    const Place oPlace = Place::Current();
    LazyOpen();
    krv::gobs::CheckRasterCompatible(poRaster, this, oPlace);
    mpoChannels->Read(*poRaster, GetMarginBehaviour(), oPlace);
}

void BasicWriter::FillMargins(krv::gobs::Raster* poRaster)
{
    mpoChannels->FillMargins(*poRaster, GetMarginBehaviour(), Place::Current());
}

void BasicWriter::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    SetLimitedMargins(nXMargin, nYMargin, eBehaviour, Place::Current());
}

// No look at the I/O here, intended: a writer of a level or of bitmaps still reaches the levels of its dataset.
IOverviewReaderAccessor* BasicWriter::GetOverviewReaderAccessor()
{
    LazyOpen();
    return new BasicOverviewReaderAccessor(dynamic_cast<IRasterDataset*>(GetDataset()), GetChannels());
}

void BasicWriter::WriteRaster(const krv::gobs::Raster* poRaster)
{
    const Place oPlace = Place::Current();
    OpenForWriting();
    Require(mpoChannels->IsOpen(), "You have to create the dataset before trying to write to it", oPlace);
    krv::gobs::CheckRasterCompatible(poRaster, this, oPlace);
    mpoChannels->Write(*poRaster, oPlace);
}

bool BasicWriter::FileExists()
{
    return GetDataset()->Exists();
}

void BasicWriter::CreateNewFile(const krv::gobs::RasterInfo& oInfo)
{
    const Place oPlace = Place::Current();
    IDataset* const poDataset = GetDataset();
    auto& oRasterDataset = RequireFacet<IRasterDataset>(
        poDataset, "Format does not support rasters: format=" + FormatName(*poDataset), oPlace);
    if (poDataset->Exists())
    {
        constexpr char MESSAGE[] = "The dataset already exists";
        throw krv::Described<krv::DataException>(poDataset->GetName() + ": " + MESSAGE, MESSAGE, oPlace);
    }
    const std::vector<unsigned int>& oChannels = GetChannels();
    Require(oChannels.empty() || oChannels.size() == oInfo.GetChansCount(),
            "The RasterInfo does not match the write channels of this writer", oPlace);
    if (oChannels.empty())
        mpoChannels->SetChannels(detail::FirstChannels(oInfo.GetChansCount()));
    LayOut(oRasterDataset, oInfo, oPlace);
    OpenDataset(false);
}

detail::OpenedChannels BasicWriter::MakeChannels(IRasterDataset& oDataset, const std::vector<unsigned int>& oChannels,
                                                 const Place& oPlace)
{
    return detail::OpenChannels(oDataset, oChannels, nullptr, oPlace);
}

void BasicWriter::LayOut(IRasterDataset& oDataset, const krv::gobs::RasterInfo& oInfo, const Place&)
{
    oDataset.Create(oInfo);
}

void BasicWriter::SetAuxiliaryData(const AuxiliaryData& oData)
{
    LazyOpen();
    AuxiliaryData oRecord = GetDataset()->ReadAuxiliaryData();
    oRecord.SetFileMetadata(oData.GetFileMetadata());
    auto* const poBitmaps = mpoChannels->IsBitmaps() ? dynamic_cast<IBitmapDataset*>(GetDataset()) : nullptr;
    unsigned int nPosition = 0;
    for (const unsigned int nChannel : GetChannels())
    {
        ++nPosition;
        const std::string description = oData.GetChannelDescription(nPosition);
        if (poBitmaps != nullptr)
        {
            poBitmaps->SetBitmapDescription(nChannel, description);
            poBitmaps->SetBitmapMetadata(nChannel, oData.GetChanMetadata(nPosition));
            continue;
        }
        oRecord.SetChanMetadata(oData.GetChanMetadata(nPosition), nChannel);
        oRecord.SetChannelDescription(description, nChannel);
    }
    GetDataset()->WriteAuxiliaryData(oRecord);
}

void BasicWriter::SetCRS(const krv::ogc::cs::ICRS* poCRS)
{
    const Place oPlace = Place::Current();
    LazyOpen();
    Require(poCRS != nullptr, "The reference system is NULL", oPlace);
    GetDataset()->UpdateCRS(*poCRS);
}

void BasicWriter::SetGeocodingInfo(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    LazyOpen();
    if (auto* const poGeocoded = dynamic_cast<IGeocodedDataset*>(GetDataset()))
        poGeocoded->SetGeocoding(oInfo);
}

IOverviewWriterAccessor* BasicWriter::GetOverviewWriterAccessor()
{
    LazyOpen();
    if (!mpoChannels->HasLevels())
        return nullptr;
    return new BasicOverviewWriterAccessor(dynamic_cast<IRasterDataset*>(GetDataset()), GetChannels());
}

void BasicWriter::Synchronize()
{
    GetDataset()->Synchronize();
}

} // namespace krv::datasources
