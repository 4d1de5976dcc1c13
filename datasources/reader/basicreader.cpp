#include "datasources/reader/basicreader.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelfilter.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
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

IRasterDataset& RequireRasterFile(const std::unique_ptr<IDataset>& oDataset, const std::string& fileName,
                                  const Place& oPlace)
{
    return detail::RequireFacet<IRasterDataset>(oDataset.get(), "Format does not support rasters: file=" + fileName,
                                                oPlace);
}

const std::vector<unsigned int>& RequireChannels(const std::vector<unsigned int>& oChannels, const std::string& message,
                                                 const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException(message, oPlace);
    return oChannels;
}

// The listed channels, or all.
std::vector<unsigned int> Available(const IRasterDataset& oRasterDataset, const std::vector<unsigned int>& oChannels,
                                    const Place& oPlace)
{
    return RequireChannels(oChannels.empty() ? detail::AllChannels(oRasterDataset) : oChannels,
                           "No available channels.", oPlace);
}

} // namespace

BasicReader::BasicReader() = default;

BasicReader::BasicReader(const std::string& fileName)
{
    std::unique_ptr<IDataset> oDataset = OpenForReading(fileName);
    const Place oPlace = Place::Current();
    try
    {
        const auto oChannels = detail::AllChannels(RequireRasterFile(oDataset, fileName, oPlace));
        RequireChannels(oChannels, "No channels in dataset: file=" + fileName, oPlace);
        UseFile(std::move(oDataset), oChannels, oPlace);
    }
    catch (const krv::Exception& oException)
    {
        throw krv::DataException(oException.GetMessage(), oPlace);
    }
    catch (const std::exception& oException)
    {
        throw krv::DataException(oException.what(), oPlace);
    }
}

BasicReader::BasicReader(const std::string& fileName, const std::vector<unsigned int>& oChannels)
{
    std::unique_ptr<IDataset> oDataset = OpenForReading(fileName);
    const Place oPlace = Place::Current();
    const auto oAvailable = Available(RequireRasterFile(oDataset, fileName, oPlace), oChannels, oPlace);
    UseFile(std::move(oDataset), oAvailable, oPlace);
}

BasicReader::BasicReader(const std::string& fileName, const IChannelFilter& oFilter)
{
    std::unique_ptr<IDataset> oDataset = OpenForReading(fileName);
    const Place oPlace = Place::Current();
    const auto oChannels = oFilter.Accept(RequireRasterFile(oDataset, fileName, oPlace));
    RequireChannels(oChannels, "No channels in dataset: file=" + fileName, oPlace);
    UseFile(std::move(oDataset), oChannels, oPlace);
}

BasicReader::BasicReader(IBitmapDataset* poDataset, const std::vector<unsigned int>& oBitmaps, bool bTakeOwnership)
{
    const Place oPlace = Place::Current();
    auto* const poRoot = dynamic_cast<IDataset*>(poDataset);
    if (poRoot == nullptr)
        throw krv::DataException("The dataset is NULL", oPlace);
    const auto oChannels = oBitmaps.empty() ? poDataset->GetBitmapList() : oBitmaps;
    RequireChannels(oChannels, "Bitmap list is empty", oPlace);
    mpoChannels->SetBitmaps();
    Commit(detail::OpenBitmaps(*poDataset, oChannels, oPlace));
    SetDataset(poRoot, oChannels, bTakeOwnership);
}

BasicReader::BasicReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels, bool bTakeOwnership)
{
    const Place oPlace = Place::Current();
    if (poDataset == nullptr)
        throw krv::DataException("The dataset is NULL", oPlace);
    const auto& oRasterDataset =
        detail::RequireFacet<IRasterDataset>(poDataset, "This dataset doesn't support Raster.", oPlace);
    UseChannels(poDataset, Available(oRasterDataset, oChannels, oPlace), nullptr, oPlace);
    mpoChannels->SetOwned(bTakeOwnership);
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
    UseChannels(poDataset, Available(*poRasterDataset, oChannels, oPlace), std::move(oRasterIO), oPlace);
}

BasicReader::~BasicReader() = default;

void BasicReader::OwnDataset(bool bOwned)
{
    mpoChannels->SetOwned(bOwned);
}

void BasicReader::UseChannels(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                              std::unique_ptr<IRasterIO> oRasterIO, const Place& oPlace)
{
    auto& oRasterDataset = dynamic_cast<IRasterDataset&>(*poDataset);
    Commit(detail::OpenChannels(oRasterDataset, oChannels, std::move(oRasterIO), oPlace));
    SetDataset(poDataset, oChannels, false);
}

void BasicReader::UseFile(std::unique_ptr<IDataset> oDataset, const std::vector<unsigned int>& oChannels,
                          const Place& oPlace)
{
    UseChannels(oDataset.get(), oChannels, nullptr, oPlace);
    mpoChannels->SetOwned(true);
    static_cast<void>(oDataset.release());
}

void BasicReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    const Place oPlace = Place::Current();
    krv::gobs::CheckRasterCompatible(poRaster, this, oPlace);
    mpoChannels->Read(*poRaster, GetMarginBehaviour(), oPlace);
}

void BasicReader::FillMargins(krv::gobs::Raster* poRaster)
{
    mpoChannels->FillMargins(*poRaster, GetMarginBehaviour(), Place::Current());
}

void BasicReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    SetLimitedMargins(nXMargin, nYMargin, eBehaviour, Place::Current());
}

IOverviewReaderAccessor* BasicReader::GetOverviewReaderAccessor()
{
    if (!mpoChannels->HasLevels())
        return nullptr;
    return new BasicOverviewReaderAccessor(dynamic_cast<IRasterDataset*>(GetDataset()), GetChannels());
}

} // namespace krv::datasources
