#include "tests/support/probe.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/exceptions/exceptions.h"

#include <stdexcept>
#include <utility>

using namespace krv::datasources;

namespace krv::test
{

void Probe::Arm(unsigned int nThrowAt, Fault eFault)
{
    moCalls.clear();
    mnThrowAt = nThrowAt;
    meFault = eFault;
    mbThrown = false;
}

void Probe::Enter(const std::string& call)
{
    moCalls.push_back(call);
    if (moCalls.size() != mnThrowAt)
        return;
    mbThrown = true;
    if (meFault == Fault::eKrv)
        throw krv::IOException("probe", "probe");
    if (meFault == Fault::eStandard)
        throw std::runtime_error("probe");
    throw 42;
}

Probe::Alive::Alive(Probe& oProbe, Kind eKind) : moProbe(oProbe), meKind(eKind)
{
    ++moProbe.moLive[meKind];
}

Probe::Alive::~Alive()
{
    --moProbe.moLive[meKind];
    moProbe.mbOrphans |= meKind == eDataset && moProbe.moLive[eDataset] == 0 && moProbe.moLive[eTransfer] > 0;
}

namespace
{

// What all decorators are: a probe, a token of being alive, and the inner object.
template <class Interface>
class Decorator : public Interface
{
protected:
    Decorator(Probe& oProbe, Interface* poInner, Probe::Kind eKind)
        : moProbe(oProbe), moAlive(oProbe, eKind), mpoInner(poInner)
    {
    }

    Interface& Inner(const char* pCall) const
    {
        moProbe.Enter(pCall);
        return *mpoInner;
    }

    // Wraps what an inner object handed out; null stays null.
    template <class Wrapper, class Object>
    Object* Wrap(Object* poObject) const
    {
        std::unique_ptr<Object> oObject(poObject);
        if (oObject == nullptr)
            return nullptr;
        auto oWrapper = std::make_unique<Wrapper>(moProbe, poObject);
        [[maybe_unused]] Object* const poTakenOver = oObject.release();
        return oWrapper.release();
    }

    Probe& moProbe;

private:
    Probe::Alive moAlive;
    std::unique_ptr<Interface> mpoInner;
};

template <class Interface>
class ProbedIO : public Decorator<Interface>
{
public:
    using Decorator<Interface>::Inner;
    ProbedIO(Probe& oProbe, IRasterIO* poInner)
        : Decorator<Interface>(oProbe, dynamic_cast<Interface*>(poInner), Probe::eTransfer)
    {
    }

    unsigned int GetFileWidth() const override { return Inner("IO::GetFileWidth").GetFileWidth(); }
    unsigned int GetFileHeight() const override { return Inner("IO::GetFileHeight").GetFileHeight(); }
    unsigned int GetTileWidth() const override { return Inner("IO::GetTileWidth").GetTileWidth(); }
    unsigned int GetTileHeight() const override { return Inner("IO::GetTileHeight").GetTileHeight(); }
    void ReadWindow(int nX, int nY, unsigned int nW, unsigned int nH, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartW, unsigned int nPartH, unsigned char* pBuffer) override
    {
        Inner("IO::ReadWindow/long").ReadWindow(nX, nY, nW, nH, nPartX, nPartY, nPartW, nPartH, pBuffer);
    }
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nW, unsigned int nH, unsigned char* pBuffer) override
    {
        Inner("IO::ReadWindow/short").ReadWindow(nX, nY, nW, nH, pBuffer);
    }
    void WriteWindow(int nX, int nY, unsigned int nW, unsigned int nH, unsigned int nPartX, unsigned int nPartY,
                     unsigned int nPartW, unsigned int nPartH, unsigned char* const pBuffer) override
    {
        Inner("IO::WriteWindow/long").WriteWindow(nX, nY, nW, nH, nPartX, nPartY, nPartW, nPartH, pBuffer);
    }
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nW, unsigned int nH,
                     unsigned char* const pBuffer) override
    {
        Inner("IO::WriteWindow/short").WriteWindow(nX, nY, nW, nH, pBuffer);
    }
};

class ProbedLevelIO : public ProbedIO<IOverviewIO>
{
public:
    using ProbedIO::ProbedIO;
    unsigned int GetLevel() const override { return Inner("IO::GetLevel").GetLevel(); }
};

class ProbedChannelInfo : public Decorator<IChannelInfo>
{
public:
    ProbedChannelInfo(Probe& oProbe, IChannelInfo* poInner) : Decorator(oProbe, poInner, Probe::eOther) {}

    const krv::gobs::DataType& GetNativeDataType() const override { return Inner("Info::Native").GetNativeDataType(); }
    const krv::gobs::DataType& GetDataType() const override { return Inner("Info::GetDataType").GetDataType(); }
    const krv::gobs::DataTypeConstraints& GetConstraints() const override
    {
        return Inner("Info::GetConstraints").GetConstraints();
    }
};

class ProbedManager : public Decorator<IOverviewManager>
{
public:
    ProbedManager(Probe& oProbe, IOverviewManager* poInner) : Decorator(oProbe, poInner, Probe::eOther) {}

    std::vector<unsigned int> GetLevels() const override { return Inner("Manager::GetLevels").GetLevels(); }
    IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override
    {
        return Wrap<ProbedLevelIO>(Inner("Manager::GetOverviewIO").GetOverviewIO(nLevel, oChannels));
    }
    void CreateLevel(unsigned int nLevel) override { Inner("Manager::CreateLevel").CreateLevel(nLevel); }
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override
    {
        return Inner("Manager::IsValid").IsValid(nChannel, nLevel);
    }
    void DeleteLevel(unsigned int nLevel) override { Inner("Manager::DeleteLevel").DeleteLevel(nLevel); }
    std::string GetResamplingName() const override { return Inner("Manager::GetResampling").GetResamplingName(); }
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override
    {
        Inner("Manager::SetValid").SetValid(nChannel, nLevel, bValid);
    }
    unsigned int GetLevelWidth(unsigned int nLevel) const override
    {
        return Inner("Manager::Width").GetLevelWidth(nLevel);
    }
    unsigned int GetLevelHeight(unsigned int nLevel) const override
    {
        return Inner("Manager::Height").GetLevelHeight(nLevel);
    }
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override
    {
        return Inner("Manager::GetAuxiliaryData").GetAuxiliaryData(nLevel);
    }
    void SetResamplingName(const std::string& oName) override
    {
        Inner("Manager::SetResampling").SetResamplingName(oName);
    }
};

class ProbedDataset : public Decorator<IDataset>, public IRasterDataset, public IGeocodedDataset, public IBitmapDataset
{
public:
    ProbedDataset(Probe& oProbe, IDataset* poInner)
        : Decorator(oProbe, poInner, Probe::eDataset), mpoRaster(dynamic_cast<IRasterDataset*>(poInner)),
          mpoGeocoded(dynamic_cast<IGeocodedDataset*>(poInner)), mpoBitmaps(dynamic_cast<IBitmapDataset*>(poInner))
    {
    }

    IFileFormat* GetFileFormat() const override { return Inner("Dataset::GetFileFormat").GetFileFormat(); }
    FileAccessState Delete() override { return Inner("Dataset::Delete").Delete(); }
    bool Exists() const override { return Inner("Dataset::Exists").Exists(); }
    std::string GetName() override { return Inner("Dataset::GetName").GetName(); }
    AuxiliaryData ReadAuxiliaryData() override { return Inner("Dataset::ReadAuxiliaryData").ReadAuxiliaryData(); }
    void WriteAuxiliaryData(const AuxiliaryData& oData) override
    {
        Inner("Dataset::WriteAuxiliaryData").WriteAuxiliaryData(oData);
    }
    krv::ogc::cs::ICRS* ReadCRS() const override { return Inner("Dataset::ReadCRS").ReadCRS(); }
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override { Inner("Dataset::UpdateCRS").UpdateCRS(oCRS); }
    bool IsLinked() const override { return Inner("Dataset::IsLinked").IsLinked(); }
    void Synchronize() override { Inner("Dataset::Synchronize").Synchronize(); }
    bool IsOpen() const override { return Inner("Dataset::IsOpen").IsOpen(); }
    void Close() override { Inner("Dataset::Close").Close(); }

    IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override
    {
        return Wrap<ProbedIO<IRasterIO>>(Raster("Raster::GetRasterIO").GetRasterIO(oChannels));
    }
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override { Raster("Raster::Add").AddNewChannel(oInfo); }
    void DeleteChannel(unsigned int nChannel) override { Raster("Raster::DeleteChannel").DeleteChannel(nChannel); }
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override
    {
        Raster("Raster::Create").Create(nWidth, nHeight, oTypes);
    }
    void Create(const krv::gobs::RasterInfo& oInfo) override { Raster("Raster::Create").Create(oInfo); }
    unsigned int GetWidth() const override { return Raster("Raster::GetWidth").GetWidth(); }
    unsigned int GetHeight() const override { return Raster("Raster::GetHeight").GetHeight(); }
    unsigned int GetChanCount() const override { return Raster("Raster::GetChanCount").GetChanCount(); }
    IChannelInfo* GetChannelInfo(unsigned int nChannel) const override
    {
        return Wrap<ProbedChannelInfo>(Raster("Raster::GetChannelInfo").GetChannelInfo(nChannel));
    }
    IHistoryIO* GetHistoryIO(unsigned int nChannel) override
    {
        return Raster("Raster::GetHistoryIO").GetHistoryIO(nChannel);
    }
    IOverviewManager* GetOverviewManager() override
    {
        return Wrap<ProbedManager>(Raster("Raster::GetOverviewManager").GetOverviewManager());
    }
    AccessCapabilities GetRasterCapabilities() override
    {
        return Raster("Raster::Capabilities").GetRasterCapabilities();
    }

    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override
    {
        moProbe.Enter("Geocoded::GetGeocoding");
        return Facet(mpoGeocoded).GetGeocoding();
    }
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override
    {
        moProbe.Enter("Geocoded::SetGeocoding");
        Facet(mpoGeocoded).SetGeocoding(oInfo);
    }

    std::vector<unsigned int> GetBitmapList() const override { return Bitmaps("Bitmap::GetList").GetBitmapList(); }
    IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override
    {
        return Wrap<ProbedIO<IRasterIO>>(Bitmaps("Bitmap::GetBitmapIO").GetBitmapIO(oBitmaps));
    }
    void DeleteBitmap(unsigned int nBitmap) override { Bitmaps("Bitmap::Delete").DeleteBitmap(nBitmap); }
    unsigned int CreateBitmap() override { return Bitmaps("Bitmap::Create").CreateBitmap(); }
    std::string GetBitmapDescription(unsigned int nBitmap) const override
    {
        return Bitmaps("Bitmap::GetDescription").GetBitmapDescription(nBitmap);
    }
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override
    {
        Bitmaps("Bitmap::SetDescription").SetBitmapDescription(nBitmap, oDescription);
    }
    MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override
    {
        return Bitmaps("Bitmap::GetMetadata").GetBitmapMetadata(nBitmap);
    }
    void SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata) override
    {
        Bitmaps("Bitmap::SetMetadata").SetBitmapMetadata(nBitmap, oMetadata);
    }
    IOverviewManager* GetBitmapOverviewManager() override
    {
        return Wrap<ProbedManager>(Bitmaps("Bitmap::GetManager").GetBitmapOverviewManager());
    }

private:
    template <class Interface>
    static Interface& Facet(Interface* poFacet)
    {
        if (poFacet == nullptr)
            throw krv::DataException("The decorated dataset has no such facet");
        return *poFacet;
    }

    IRasterDataset& Raster(const char* pCall) const
    {
        moProbe.Enter(pCall);
        return Facet(mpoRaster);
    }
    IBitmapDataset& Bitmaps(const char* pCall) const
    {
        moProbe.Enter(pCall);
        return Facet(mpoBitmaps);
    }

    IRasterDataset* mpoRaster;
    IGeocodedDataset* mpoGeocoded;
    IBitmapDataset* mpoBitmaps;
};

} // namespace

std::unique_ptr<IDataset> Decorate(Probe& oProbe, std::unique_ptr<IDataset> poInner)
{
    auto oDecorated = std::make_unique<ProbedDataset>(oProbe, poInner.get());
    [[maybe_unused]] IDataset* const poTakenOver = poInner.release();
    return oDecorated;
}

FunctionBuilder::FunctionBuilder(const std::string& shortName, Probe* poProbe)
    : moFormat(std::make_unique<SimpleFormat>(shortName)), mpoProbe(poProbe)
{
    if (mpoProbe != nullptr)
        moAlive = std::make_unique<Probe::Alive>(*mpoProbe, Probe::eOther);
}

FunctionBuilder::~FunctionBuilder() = default;

void FunctionBuilder::Enter(const char* pCall)
{
    if (mpoProbe != nullptr)
        mpoProbe->Enter((moFormat != nullptr ? moFormat->GetShortName() : std::string()) + "::" + pCall);
}

IDataset* FunctionBuilder::Open(const std::string& fileName, AccessMode eMode)
{
    Enter("Open");
    return moOpen ? moOpen(fileName, eMode) : nullptr;
}

IDataset* FunctionBuilder::Create(const std::string& fileName, const std::string& options)
{
    Enter("Create");
    return moCreate ? moCreate(fileName, options) : nullptr;
}

int FunctionBuilder::Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                              int nReserved)
{
    Enter("Identify");
    return moIdentify ? moIdentify(fileName, pHeader, nHeaderLength, nReserved) : 1;
}

} // namespace krv::test
