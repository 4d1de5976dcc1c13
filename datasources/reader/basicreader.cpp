#include "datasources/reader/basicreader.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelfilter.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::datasources
{

namespace
{

std::unique_ptr<IDataset> OpenForReading(const std::string& fileName)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(fileName, eReadOnly));
}

IRasterDataset& RequireRaster(IDataset* poDataset, const std::string& message, const Place& oPlace)
{
    auto* const poRasterDataset = dynamic_cast<IRasterDataset*>(poDataset);
    if (poRasterDataset == nullptr)
        throw krv::DataException(message, oPlace);
    return *poRasterDataset;
}

void RequireChannels(const std::vector<unsigned int>& oChannels, const std::string& message, const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException(message, oPlace);
}

} // namespace

BasicReader::BasicReader() = default;

BasicReader::BasicReader(const std::string& fileName)
{
    std::unique_ptr<IDataset> oDataset = OpenForReading(fileName);
    const Place oPlace = Place::Current();
    try
    {
        IRasterDataset& oRasterDataset =
            RequireRaster(oDataset.get(), "Format does not support rasters: file=" + fileName, oPlace);
        mpoChannels->moChannels = detail::AllChannels(oRasterDataset);
        RequireChannels(mpoChannels->moChannels, "No channels in dataset: file=" + fileName, oPlace);
        UseChannels(oDataset.get(), oRasterDataset, nullptr, oPlace);
    }
    catch (const krv::Exception& oException)
    {
        throw krv::DataException(oException.GetMessage(), oPlace);
    }
    catch (const std::exception& oException)
    {
        throw krv::DataException(oException.what(), oPlace);
    }
    TakeDataset(std::move(oDataset));
}

BasicReader::BasicReader(const std::string& fileName, const std::vector<unsigned int>& oChannels)
{
    std::unique_ptr<IDataset> oDataset = OpenForReading(fileName);
    const Place oPlace = Place::Current();
    IRasterDataset& oRasterDataset =
        RequireRaster(oDataset.get(), "Format does not support rasters: file=" + fileName, oPlace);
    mpoChannels->moChannels = oChannels.empty() ? detail::AllChannels(oRasterDataset) : oChannels;
    RequireChannels(mpoChannels->moChannels, "No available channels.", oPlace);
    UseChannels(oDataset.get(), oRasterDataset, nullptr, oPlace);
    TakeDataset(std::move(oDataset));
}

BasicReader::BasicReader(const std::string& fileName, const IChannelFilter& oFilter)
{
    std::unique_ptr<IDataset> oDataset = OpenForReading(fileName);
    const Place oPlace = Place::Current();
    IRasterDataset& oRasterDataset =
        RequireRaster(oDataset.get(), "Format does not support rasters: file=" + fileName, oPlace);
    mpoChannels->moChannels = oFilter.Accept(oRasterDataset);
    RequireChannels(mpoChannels->moChannels, "No channels in dataset: file=" + fileName, oPlace);
    UseChannels(oDataset.get(), oRasterDataset, nullptr, oPlace);
    TakeDataset(std::move(oDataset));
}

BasicReader::BasicReader(IBitmapDataset* poDataset, const std::vector<unsigned int>& oBitmaps, bool bTakeOwnership)
{
    const Place oPlace = Place::Current();
    mpoChannels->mpoDataset = dynamic_cast<IDataset*>(poDataset);
    if (mpoChannels->mpoDataset == nullptr)
        throw krv::DataException("The dataset is NULL", oPlace);
    mpoChannels->mbBitmaps = true;
    mpoChannels->moChannels = oBitmaps.empty() ? poDataset->GetBitmapList() : oBitmaps;
    RequireChannels(mpoChannels->moChannels, "Bitmap list is empty", oPlace);
    mpoChannels->Commit(detail::OpenBitmaps(*poDataset, mpoChannels->moChannels, oPlace));
    mpoChannels->mbOwnsDataset = bTakeOwnership;
}

BasicReader::BasicReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bTakeOwnership)
{
    const Place oPlace = Place::Current();
    if (poDataset == nullptr)
        throw krv::DataException("The dataset is NULL", oPlace);
    IRasterDataset& oRasterDataset = RequireRaster(poDataset, "This dataset doesn't support Raster.", oPlace);
    mpoChannels->moChannels = oChannels.empty() ? detail::AllChannels(oRasterDataset) : oChannels;
    RequireChannels(mpoChannels->moChannels, "No available channels.", oPlace);
    UseChannels(poDataset, oRasterDataset, nullptr, oPlace);
    mpoChannels->mbOwnsDataset = bTakeOwnership;
}

BasicReader::BasicReader(IRasterDataset* poRasterDataset, IRasterIO* poRasterIO,
                         const std::vector<unsigned int>& oChannels)
{
    std::unique_ptr<IRasterIO> oRasterIO(poRasterIO);
    const Place oPlace = Place::Current();
    if (poRasterDataset == nullptr)
        throw krv::DataException("Invalid Raster Dataset: poRDS cannot be NULL", oPlace);
    if (oRasterIO == nullptr)
        throw krv::DataException("Invalid Raster IO: poRasterIO cannot be NULL", oPlace);
    auto* const poDataset = dynamic_cast<IDataset*>(poRasterDataset);
    if (poDataset == nullptr)
        throw krv::DataException("Invalid Raster Dataset", oPlace);
    mpoChannels->moChannels = oChannels.empty() ? detail::AllChannels(*poRasterDataset) : oChannels;
    RequireChannels(mpoChannels->moChannels, "No available channels.", oPlace);
    UseChannels(poDataset, *poRasterDataset, std::move(oRasterIO), oPlace);
}

BasicReader::~BasicReader() = default;

void BasicReader::UseChannels(IDataset* poDataset, IRasterDataset& oRasterDataset, std::unique_ptr<IRasterIO> oRasterIO,
                              const Place& oPlace)
{
    mpoChannels->Commit(detail::OpenChannels(oRasterDataset, mpoChannels->moChannels, std::move(oRasterIO), oPlace));
    mpoChannels->mpoDataset = poDataset;
}

void BasicReader::TakeDataset(std::unique_ptr<IDataset> oDataset)
{
    mpoChannels->mpoDataset = oDataset.release();
    mpoChannels->mbOwnsDataset = true;
}

krv::gobs::Raster* BasicReader::GetRaster(unsigned int nIndex)
{
    std::unique_ptr<krv::gobs::Raster> oRaster = mpoChannels->MakeTile(nIndex, Place::Current());
    ReadRaster(oRaster.get()); // virtual: a derived reader fills its own way
    return oRaster.release();
}

krv::gobs::Raster* BasicReader::ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
{
    std::unique_ptr<krv::gobs::Raster> oRaster = mpoChannels->MakeRaster(nX, nY, nWidth, nHeight, Place::Current());
    ReadRaster(oRaster.get());
    return oRaster.release();
}

void BasicReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    const Place oPlace = Place::Current();
    krv::gobs::CheckRasterCompatible(poRaster, this, oPlace);
    mpoChannels->Read(*poRaster, oPlace);
}

void BasicReader::FillMargins(krv::gobs::Raster* poRaster)
{
    mpoChannels->FillMargins(*poRaster, Place::Current());
}

void BasicReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    mpoChannels->SetMargins(nXMargin, nYMargin, eBehaviour, Place::Current());
}

IOverviewReaderAccessor* BasicReader::GetOverviewReaderAccessor()
{
    const bool bOnLevel = dynamic_cast<IOverviewIO*>(mpoChannels->moOpened.mpoRasterIO.get()) != nullptr;
    if (bOnLevel || mpoChannels->mbBitmaps)
        return nullptr;
    auto* const poRasterDataset = dynamic_cast<IRasterDataset*>(mpoChannels->mpoDataset);
    return new BasicOverviewReaderAccessor(poRasterDataset, mpoChannels->moChannels);
}

} // namespace krv::datasources
