#include "datasources/utils/open.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/maskbuilder/maskio.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/defaultreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/defaultwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <numeric>
#include <utility>

namespace krv
{

using namespace krv::datasources;
using krv::gobs::Raster;

namespace
{

template <typename Object>
std::unique_ptr<Object> Require(Object* poObject, const std::string& fileName, const Place& oPlace)
{
    if (poObject == nullptr)
        throw DataException(fileName + ": its format gives nothing", oPlace);
    return std::unique_ptr<Object>(poObject);
}

// All channels for an empty list; of what holds no image it stays empty, and whoever opens it says so.
std::vector<unsigned int> AllIfNone(const IDataset& oDataset, std::vector<unsigned int> oChannels)
{
    const auto* const poRaster = dynamic_cast<const IRasterDataset*>(&oDataset);
    if (oChannels.empty() && poRaster != nullptr)
    {
        oChannels.resize(poRaster->GetChanCount());
        std::iota(oChannels.begin(), oChannels.end(), 1U);
    }
    return oChannels;
}

// A level's reader with the accessor that has to outlive it.
struct LevelHolder
{
    std::unique_ptr<IOverviewReaderAccessor> mpoAccessor;
    std::unique_ptr<IRasterReader> mpoReader;
};

} // namespace

std::unique_ptr<IDataset> Open(const std::string& fileName, AccessMode eMode)
{
    return Require(DatasetManager::GetInstance()->Open(fileName, eMode), fileName, Place::Current());
}

std::unique_ptr<IDataset> Create(const std::string& fileName, const std::string& format, const std::string& options)
{
    return Require(DatasetManager::GetInstance()->NewDataset(fileName, format, options), fileName, Place::Current());
}

std::unique_ptr<IRasterReader> OpenReader(const std::string& fileName, const std::vector<unsigned int>& oChannels)
{
    std::unique_ptr<IDataset> poDataset = Open(fileName);
    const auto oList = AllIfNone(*poDataset, oChannels);
    try
    {
        auto poReader = std::make_unique<BasicReader>(poDataset.get(), oList, true);
        static_cast<void>(poDataset.release());
        return poReader;
    }
    catch (const Exception&)
    {
        if (oList.size() < 2)
            throw;
    }
    return std::make_unique<MultiTypeReader>(fileName, oList);
}

std::unique_ptr<IRasterReader> OpenReader(IDataset& oDataset, const std::vector<unsigned int>& oChannels)
{
    return std::unique_ptr<IRasterReader>(CreateDefaultReader(&oDataset, AllIfNone(oDataset, oChannels)));
}

std::unique_ptr<ExactHaloReader> OpenHaloReader(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                                unsigned int nMargin, eMarginBehaviour eBehaviour)
{
    std::unique_ptr<IRasterReader> poSource = OpenReader(fileName, oChannels);
    auto poReader = std::make_unique<ExactHaloReader>(poSource.get(), true);
    static_cast<void>(poSource.release());
    poReader->SetMargins(nMargin, nMargin, eBehaviour);
    return poReader;
}

std::unique_ptr<IRasterWriter> OpenWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels)
{
    return std::unique_ptr<IRasterWriter>(CreateDefaultWriter(fileName, oChannels));
}

std::unique_ptr<IRasterWriter> CreateWriter(const std::string& fileName, const gobs::RasterInfo& oInfo,
                                            const std::string& format, const std::string& options)
{
    std::vector<unsigned int> oChannels(oInfo.GetChansCount());
    std::iota(oChannels.begin(), oChannels.end(), 1U);
    auto poWriter = std::make_unique<BasicWriter>(fileName, oChannels, format, options);
    poWriter->CreateNewFile(oInfo);
    return poWriter;
}

std::unique_ptr<Raster> Read(IRasterReader& oReader, const ogc::cs::PixelWindow& oWindow)
{
    return std::unique_ptr<Raster>(oReader.ReadRaster(oWindow.x, oWindow.y, oWindow.width, oWindow.height));
}

std::unique_ptr<Raster> Read(IRasterReader& oReader, const ogc::cs::MapBounds& oBounds)
{
    const auto oWindow = FindWindow(oReader, oBounds);
    if (!oWindow)
        throw DataException("The bounds hold no pixel of the image");
    return Read(oReader, *oWindow);
}

std::optional<ogc::cs::PixelWindow> FindWindow(const IRasterReader& oReader, const ogc::cs::MapBounds& oBounds)
{
    const auto oInfo = GetGeocoding(oReader);
    if (!oInfo)
        return std::nullopt;
    return ogc::cs::WindowOf(*oInfo, oReader.GetWidth(), oReader.GetHeight(), oBounds);
}

std::unique_ptr<Raster> ReadTile(IRasterIterable& oTiles, unsigned int nIndex)
{
    return std::unique_ptr<Raster>(oTiles.GetRaster(nIndex));
}

std::unique_ptr<gobs::Mask> ReadBitmap(IDataset& oDataset, unsigned int nBitmap, const ogc::cs::PixelWindow& oWindow)
{
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(&oDataset);
    if (poBitmaps == nullptr)
        throw DataException(oDataset.GetName() + ": its format has no bitmaps");
    gobs::RasterInfo oInfo(oWindow.width, oWindow.height, 1, gobs::eDT_8U);
    gobs::RasterContext oContext(static_cast<int>(oWindow.x), static_cast<int>(oWindow.y));
    return std::unique_ptr<gobs::Mask>(ReadMask(*poBitmaps, nBitmap, oInfo, oContext));
}

std::unique_ptr<ogc::cs::ICRS> GetCRS(const IRasterReader& oReader)
{
    return std::unique_ptr<ogc::cs::ICRS>(oReader.GetCRS());
}

std::optional<ogc::cs::GeocodingInfo> GetGeocoding(const IRasterReader& oReader)
{
    const std::unique_ptr<ogc::cs::GeocodingInfo> poInfo(oReader.GetGeocodingInfo());
    return poInfo != nullptr ? std::optional(*poInfo) : std::nullopt;
}

std::vector<unsigned int> GetLevels(IRasterReader& oReader)
{
    const std::unique_ptr<IOverviewReaderAccessor> poAccessor(oReader.GetOverviewReaderAccessor());
    std::vector<unsigned int> oLevels = poAccessor != nullptr ? poAccessor->GetLevels() : std::vector<unsigned int>();
    std::erase_if(oLevels, [&](unsigned int nLevel) { return !poAccessor->IsLevelValid(nLevel); });
    std::sort(oLevels.begin(), oLevels.end());
    return oLevels;
}

std::shared_ptr<IRasterReader> OpenLevel(IRasterReader& oReader, unsigned int nLevel)
{
    const auto poHolder = std::make_shared<LevelHolder>();
    poHolder->mpoAccessor.reset(oReader.GetOverviewReaderAccessor());
    if (poHolder->mpoAccessor == nullptr)
        throw DataException("The image has no levels");
    poHolder->mpoReader.reset(poHolder->mpoAccessor->CreateRasterReader(nLevel));
    return {poHolder, poHolder->mpoReader.get()};
}

} // namespace krv
