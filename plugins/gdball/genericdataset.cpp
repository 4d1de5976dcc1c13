#include "plugins/gdball/genericdataset.h"

#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

#include <cstdio>
#include <map>
#include <mutex>

namespace krv::plugins::gdball
{

using namespace krv::datasources;

namespace
{

// What stands in the table of open files, by its entry.
struct Register
{
    std::mutex moMutex; // guards moImages
    std::map<std::FILE*, std::weak_ptr<SharedImage>> moImages;
};

Register& GetRegister()
{
    static Register* const poRegister = new Register;
    return *poRegister;
}

const char* GetModeText(AccessMode eMode)
{
    return eMode == eUpdate ? "r+" : "r";
}

bool IsGeneric(std::FILE* pFile, void*)
{
    return fpTestFlag(pFile, eGenericFile) != 0;
}

// Tells the levels of changes of pixels.
class WatchedIO : public IRasterIO
{
public:
    WatchedIO(std::unique_ptr<IRasterIO> poOwn, std::shared_ptr<SharedImage> poImage)
        : mpoImage(std::move(poImage)), mpoOwn(std::move(poOwn))
    {
    }
    ~WatchedIO() override = default;

    unsigned int GetFileWidth() const override { return mpoOwn->GetFileWidth(); }
    unsigned int GetFileHeight() const override { return mpoOwn->GetFileHeight(); }
    unsigned int GetTileWidth() const override { return mpoOwn->GetTileWidth(); }
    unsigned int GetTileHeight() const override { return mpoOwn->GetTileHeight(); }
    void ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartWidth, unsigned int nPartHeight, unsigned char* pBuffer) override
    {
        mpoOwn->ReadWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    }
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                    unsigned char* pBuffer) override
    {
        mpoOwn->ReadWindow(nX, nY, nWidth, nHeight, pBuffer);
    }
    void WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                     unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                     unsigned char* const pBuffer) override
    {
        mpoImage->GetLevels().ForgetLevels();
        mpoOwn->WriteWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    }
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                     unsigned char* const pBuffer) override
    {
        mpoImage->GetLevels().ForgetLevels();
        mpoOwn->WriteWindow(nX, nY, nWidth, nHeight, pBuffer);
    }

private:
    std::shared_ptr<SharedImage> mpoImage;
    std::unique_ptr<IRasterIO> mpoOwn; // goes first
};

// The levels as a manager, which keeps what it stands on.
class GenericLevels : public IOverviewManager, public ILevelStates
{
public:
    explicit GenericLevels(std::shared_ptr<SharedImage> poImage) : mpoImage(std::move(poImage)) {}
    ~GenericLevels() override = default;

    std::vector<unsigned int> GetLevels() const override { return Get().GetLevels(); }
    IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override
    {
        return Get().OpenLevel(nLevel, oChannels);
    }
    void CreateLevel(unsigned int nLevel) override { Get().MakeLevel(nLevel); }
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override { return Get().IsValid(nChannel, nLevel); }
    void DeleteLevel(unsigned int nLevel) override { Get().DropLevel(nLevel); }
    std::string GetResamplingName() const override { return Get().GetMethod(); }
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override
    {
        Get().SetValid({nChannel}, nLevel, bValid);
    }
    void SetChannelsValid(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid) override
    {
        Get().SetValid(oChannels, nLevel, bValid);
    }
    unsigned int GetLevelWidth(unsigned int nLevel) const override { return Get().GetSize(nLevel).first; }
    unsigned int GetLevelHeight(unsigned int nLevel) const override { return Get().GetSize(nLevel).second; }
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override { return Get().ReadRecord(nLevel); }
    void SetResamplingName(const std::string& oName) override { Get().SetMethod(oName); }

private:
    LevelsBeside& Get() const { return mpoImage->GetLevels(); }

    std::shared_ptr<SharedImage> mpoImage;
};

} // namespace

SharedImage::SharedImage(const std::string& fileName, std::unique_ptr<IDataset> poImage, AccessMode eMode)
    : moName(fileName), mpoImage(std::move(poImage)), mpoRaster(dynamic_cast<IRasterDataset*>(mpoImage.get())),
      meMode(eMode)
{
    if (mpoRaster == nullptr)
        throw DataException(fileName + ": the file holds no image");
    // Files that are opened by the name of their header have another one.
    mpoLevels = std::make_unique<LevelsBeside>(mpoImage->GetName(), *mpoRaster, eMode);
    if (eMode == eUpdate && !mpoRaster->GetRasterCapabilities().IsUpdatable())
        mpoBeside = Find<ISidecarWriting>();
    if (mpoBeside != nullptr)
        mpoBeside->BeginSidecars();
}

SharedImage::~SharedImage()
{
    Leave();
}

void SharedImage::Leave()
{
    if (mpToken == nullptr)
        return;
    fpRemove(mpToken);
    {
        const std::lock_guard oLock(GetRegister().moMutex);
        GetRegister().moImages.erase(mpToken);
    }
    std::fclose(mpToken);
    mpToken = nullptr;
}

std::shared_ptr<SharedImage> SharedImage::Find(const std::string& fileName, AccessMode eMode)
{
    std::FILE* pFile = nullptr;
    if (!fpCompare(fileName, GetModeText(eMode), &pFile, &IsGeneric, nullptr))
        return nullptr;
    const std::lock_guard oLock(GetRegister().moMutex);
    const auto oFound = GetRegister().moImages.find(pFile);
    auto poImage = oFound == GetRegister().moImages.end() ? nullptr : oFound->second.lock();
    if (poImage == nullptr) // the manager would ask here again, for ever
        throw FileFormatException(fileName, fileName + ": stands in the table of open files, but is not open here");
    return poImage;
}

void SharedImage::Enter(const std::shared_ptr<SharedImage>& poImage)
{
    poImage->mpToken = std::fopen(poImage->moName.c_str(), "rb");
    if (poImage->mpToken == nullptr)
        return;
    {
        const std::lock_guard oLock(GetRegister().moMutex);
        GetRegister().moImages[poImage->mpToken] = poImage;
    }
    fpAdd(poImage->moName, GetModeText(poImage->meMode), poImage->mpToken, eGenericFile);
}

// The image first: levels are to be younger than it.
void SharedImage::Synchronize()
{
    mpoImage->Synchronize();
    mpoLevels->Synchronize();
}

void SharedImage::RemoveDataset(bool bClose)
{
    if (--mnDatasets != 0)
        return;
    Leave();
    if (!bClose)
        return;
    mpoImage->Close();
    mpoLevels->Close();
}

GenericDataset::GenericDataset(std::shared_ptr<SharedImage> poImage)
    : moName(poImage->GetName()), mpoImage(std::move(poImage))
{
    mpoImage->AddDataset();
}

GenericDataset::~GenericDataset()
{
    if (mpoImage)
        mpoImage->RemoveDataset(false);
}

SharedImage& GenericDataset::Get(const Place& oPlace) const
{
    if (!mpoImage)
        throw DataException(moName + ": the dataset is closed", oPlace);
    return *mpoImage;
}

template <typename Facet>
Facet& GenericDataset::Need(const char* pWhat, const Place& oPlace) const
{
    auto* const poFacet = Get(oPlace).Find<Facet>();
    if (poFacet == nullptr)
        throw DataException(moName + ": the format of the file has no " + pWhat, oPlace);
    return *poFacet;
}

IFileFormat* GenericDataset::GetFileFormat() const
{
    return Get().GetImage().GetFileFormat();
}

FileAccessState GenericDataset::Delete()
{
    const auto poImage = std::move(mpoImage);
    if (!poImage)
        return eNotFound;
    const FileAccessState eState = poImage->GetImage().Delete();
    poImage->RemoveDataset(false);
    return eState;
}

bool GenericDataset::Exists() const
{
    return mpoImage && mpoImage->GetImage().Exists();
}

AuxiliaryData GenericDataset::ReadAuxiliaryData()
{
    return Get().GetImage().ReadAuxiliaryData();
}

void GenericDataset::WriteAuxiliaryData(const AuxiliaryData& oData)
{
    if (auto* const poBeside = Get().GetBeside())
        return poBeside->WriteTagsBeside(oData);
    Get().GetImage().WriteAuxiliaryData(oData);
}

krv::ogc::cs::ICRS* GenericDataset::ReadCRS() const
{
    return Get().GetImage().ReadCRS();
}

void GenericDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    if (auto* const poBeside = Get().GetBeside())
        return poBeside->WriteCRSBeside(oCRS);
    Get().GetImage().UpdateCRS(oCRS);
}

bool GenericDataset::IsLinked() const
{
    return Get().GetImage().IsLinked();
}

void GenericDataset::Synchronize()
{
    Get().Synchronize();
}

void GenericDataset::Close()
{
    const auto poImage = std::move(mpoImage);
    if (poImage)
        poImage->RemoveDataset(true);
}

IRasterIO* GenericDataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    return new WatchedIO(std::unique_ptr<IRasterIO>(Get().GetRaster().GetRasterIO(oChannels)), mpoImage);
}

void GenericDataset::AddNewChannel(const krv::gobs::RasterInfo& oInfo)
{
    Get().GetRaster().AddNewChannel(oInfo);
}

void GenericDataset::DeleteChannel(unsigned int nChannel)
{
    Get().GetRaster().DeleteChannel(nChannel);
}

void GenericDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    Get().GetRaster().Create(nWidth, nHeight, oTypes);
}

void GenericDataset::Create(const krv::gobs::RasterInfo& oInfo)
{
    Get().GetRaster().Create(oInfo);
}

unsigned int GenericDataset::GetWidth() const
{
    return Get().GetRaster().GetWidth();
}

unsigned int GenericDataset::GetHeight() const
{
    return Get().GetRaster().GetHeight();
}

unsigned int GenericDataset::GetChanCount() const
{
    return Get().GetRaster().GetChanCount();
}

IChannelInfo* GenericDataset::GetChannelInfo(unsigned int nChannel) const
{
    return Get().GetRaster().GetChannelInfo(nChannel);
}

IHistoryIO* GenericDataset::GetHistoryIO(unsigned int nChannel)
{
    return Get().GetRaster().GetHistoryIO(nChannel);
}

IOverviewManager* GenericDataset::GetOverviewManager()
{
    Get();
    return new GenericLevels(mpoImage);
}

AccessCapabilities GenericDataset::GetRasterCapabilities()
{
    return Get().GetRaster().GetRasterCapabilities();
}

const krv::ogc::cs::GeocodingInfo& GenericDataset::GetGeocoding() const
{
    if (Get().GetGeocoding())
        return *Get().GetGeocoding();
    const auto* const poGeocoded = Get().Find<IGeocodedDataset>();
    return poGeocoded != nullptr ? poGeocoded->GetGeocoding() : moIdentity;
}

void GenericDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    auto* const poBeside = Get().GetBeside();
    if (poBeside == nullptr)
        return Need<IGeocodedDataset>("geocoding").SetGeocoding(oInfo);
    poBeside->WriteGeocodingBeside(oInfo);
    Get().SetGeocoding(oInfo);
}

void GenericDataset::RemoveCRS()
{
    if (auto* const poBeside = Get().GetBeside())
        return poBeside->RemoveCRSBeside();
    Need<IPlaceRemoval>("a reference system that can be removed").RemoveCRS();
}

void GenericDataset::RemoveGeocoding()
{
    auto* const poBeside = Get().GetBeside();
    if (poBeside == nullptr)
        return Need<IPlaceRemoval>("a geocoding that can be removed").RemoveGeocoding();
    poBeside->RemoveGeocodingBeside();
    Get().SetGeocoding({});
}

std::vector<unsigned int> GenericDataset::GetBitmapList() const
{
    const auto* const poBitmaps = Get().Find<IBitmapDataset>();
    return poBitmaps != nullptr ? poBitmaps->GetBitmapList() : std::vector<unsigned int>();
}

IRasterIO* GenericDataset::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    return Need<IBitmapDataset>("bitmaps").GetBitmapIO(oBitmaps);
}

void GenericDataset::DeleteBitmap(unsigned int nBitmap)
{
    Need<IBitmapDataset>("bitmaps").DeleteBitmap(nBitmap);
}

unsigned int GenericDataset::CreateBitmap()
{
    return Need<IBitmapDataset>("bitmaps").CreateBitmap();
}

std::string GenericDataset::GetBitmapDescription(unsigned int nBitmap) const
{
    return Need<IBitmapDataset>("bitmaps").GetBitmapDescription(nBitmap);
}

void GenericDataset::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    Need<IBitmapDataset>("bitmaps").SetBitmapDescription(nBitmap, oDescription);
}

MetadataMap GenericDataset::GetBitmapMetadata(unsigned int nBitmap) const
{
    return Need<IBitmapDataset>("bitmaps").GetBitmapMetadata(nBitmap);
}

void GenericDataset::SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata)
{
    Need<IBitmapDataset>("bitmaps").SetBitmapMetadata(nBitmap, oMetadata);
}

IOverviewManager* GenericDataset::GetBitmapOverviewManager()
{
    return nullptr;
}

std::vector<unsigned int> GenericDataset::GetPCTList() const
{
    const auto* const poTables = Get().Find<IPCTDataset>();
    return poTables != nullptr ? poTables->GetPCTList() : std::vector<unsigned int>();
}

krv::gobs::PCT* GenericDataset::GetPCT(unsigned int nPCT) const
{
    return Need<IPCTDataset>("colour tables").GetPCT(nPCT);
}

unsigned int GenericDataset::GetPCTChannel(unsigned int nPCT) const
{
    return Need<IPCTDataset>("colour tables").GetPCTChannel(nPCT);
}

std::string GenericDataset::GetPCTDescription(unsigned int nPCT) const
{
    return Need<IPCTDataset>("colour tables").GetPCTDescription(nPCT);
}

unsigned int GenericDataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    return Need<IPCTDataset>("colour tables").CreatePCT(oTable, nChannel);
}

void GenericDataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    Need<IPCTDataset>("colour tables").UpdatePCT(nPCT, oTable);
}

void GenericDataset::SetPCTDescription(unsigned int nPCT, const std::string& oDescription)
{
    Need<IPCTDataset>("colour tables").SetPCTDescription(nPCT, oDescription);
}

void GenericDataset::DeletePCT(unsigned int nPCT)
{
    Need<IPCTDataset>("colour tables").DeletePCT(nPCT);
}

} // namespace krv::plugins::gdball
