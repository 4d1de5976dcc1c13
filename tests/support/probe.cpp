#include "tests/support/probe.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/exceptions/exceptions.h"

#include <source_location>
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

    Interface& Inner(std::source_location oCall = std::source_location::current()) const
    {
        moProbe.Enter(oCall.function_name());
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

    unsigned int GetFileWidth() const override { return Inner().GetFileWidth(); }
    unsigned int GetFileHeight() const override { return Inner().GetFileHeight(); }
    unsigned int GetTileWidth() const override { return Inner().GetTileWidth(); }
    unsigned int GetTileHeight() const override { return Inner().GetTileHeight(); }
    void ReadWindow(int nX, int nY, unsigned int nW, unsigned int nH, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartW, unsigned int nPartH, unsigned char* pBuffer) override
    {
        Inner().ReadWindow(nX, nY, nW, nH, nPartX, nPartY, nPartW, nPartH, pBuffer);
    }
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nW, unsigned int nH, unsigned char* pBuffer) override
    {
        Inner().ReadWindow(nX, nY, nW, nH, pBuffer);
    }
    void WriteWindow(int nX, int nY, unsigned int nW, unsigned int nH, unsigned int nPartX, unsigned int nPartY,
                     unsigned int nPartW, unsigned int nPartH, unsigned char* const pBuffer) override
    {
        Inner().WriteWindow(nX, nY, nW, nH, nPartX, nPartY, nPartW, nPartH, pBuffer);
    }
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nW, unsigned int nH,
                     unsigned char* const pBuffer) override
    {
        Inner().WriteWindow(nX, nY, nW, nH, pBuffer);
    }
};

class ProbedLevelIO : public ProbedIO<IOverviewIO>
{
public:
    using ProbedIO::ProbedIO;
    unsigned int GetLevel() const override { return Inner().GetLevel(); }
};

class ProbedChannelInfo : public Decorator<IChannelInfo>
{
public:
    ProbedChannelInfo(Probe& oProbe, IChannelInfo* poInner) : Decorator(oProbe, poInner, Probe::eOther) {}

    const krv::gobs::DataType& GetNativeDataType() const override { return Inner().GetNativeDataType(); }
    const krv::gobs::DataType& GetDataType() const override { return Inner().GetDataType(); }
    const krv::gobs::DataTypeConstraints& GetConstraints() const override { return Inner().GetConstraints(); }
};

class ProbedManager : public Decorator<IOverviewManager>
{
public:
    ProbedManager(Probe& oProbe, IOverviewManager* poInner) : Decorator(oProbe, poInner, Probe::eOther) {}

    std::vector<unsigned int> GetLevels() const override { return Inner().GetLevels(); }
    IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override
    {
        return Wrap<ProbedLevelIO>(Inner().GetOverviewIO(nLevel, oChannels));
    }
    void CreateLevel(unsigned int nLevel) override { Inner().CreateLevel(nLevel); }
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override
    {
        return Inner().IsValid(nChannel, nLevel);
    }
    void DeleteLevel(unsigned int nLevel) override { Inner().DeleteLevel(nLevel); }
    std::string GetResamplingName() const override { return Inner().GetResamplingName(); }
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override
    {
        Inner().SetValid(nChannel, nLevel, bValid);
    }
    unsigned int GetLevelWidth(unsigned int nLevel) const override { return Inner().GetLevelWidth(nLevel); }
    unsigned int GetLevelHeight(unsigned int nLevel) const override { return Inner().GetLevelHeight(nLevel); }
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override { return Inner().GetAuxiliaryData(nLevel); }
    void SetResamplingName(const std::string& oName) override { Inner().SetResamplingName(oName); }
};

class ProbedDataset : public Decorator<IDataset>, public IRasterDataset, public IGeocodedDataset, public IBitmapDataset
{
public:
    ProbedDataset(Probe& oProbe, IDataset* poInner)
        : Decorator(oProbe, poInner, Probe::eDataset), mpoRaster(dynamic_cast<IRasterDataset*>(poInner)),
          mpoGeocoded(dynamic_cast<IGeocodedDataset*>(poInner)), mpoBitmaps(dynamic_cast<IBitmapDataset*>(poInner))
    {
    }

    IFileFormat* GetFileFormat() const override { return Inner().GetFileFormat(); }
    FileAccessState Delete() override { return Inner().Delete(); }
    bool Exists() const override { return Inner().Exists(); }
    std::string GetName() override { return Inner().GetName(); }
    AuxiliaryData ReadAuxiliaryData() override { return Inner().ReadAuxiliaryData(); }
    void WriteAuxiliaryData(const AuxiliaryData& oData) override { Inner().WriteAuxiliaryData(oData); }
    krv::ogc::cs::ICRS* ReadCRS() const override { return Inner().ReadCRS(); }
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override { Inner().UpdateCRS(oCRS); }
    bool IsLinked() const override { return Inner().IsLinked(); }
    void Synchronize() override { Inner().Synchronize(); }
    bool IsOpen() const override { return Inner().IsOpen(); }
    void Close() override { Inner().Close(); }

    IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override
    {
        return Wrap<ProbedIO<IRasterIO>>(Raster().GetRasterIO(oChannels));
    }
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override { Raster().AddNewChannel(oInfo); }
    void DeleteChannel(unsigned int nChannel) override { Raster().DeleteChannel(nChannel); }
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override
    {
        Raster().Create(nWidth, nHeight, oTypes);
    }
    void Create(const krv::gobs::RasterInfo& oInfo) override { Raster().Create(oInfo); }
    unsigned int GetWidth() const override { return Raster().GetWidth(); }
    unsigned int GetHeight() const override { return Raster().GetHeight(); }
    unsigned int GetChanCount() const override { return Raster().GetChanCount(); }
    IChannelInfo* GetChannelInfo(unsigned int nChannel) const override
    {
        return Wrap<ProbedChannelInfo>(Raster().GetChannelInfo(nChannel));
    }
    IHistoryIO* GetHistoryIO(unsigned int nChannel) override { return Raster().GetHistoryIO(nChannel); }
    IOverviewManager* GetOverviewManager() override { return Wrap<ProbedManager>(Raster().GetOverviewManager()); }
    AccessCapabilities GetRasterCapabilities() override { return Raster().GetRasterCapabilities(); }

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

    std::vector<unsigned int> GetBitmapList() const override { return Bitmaps().GetBitmapList(); }
    IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override
    {
        return Wrap<ProbedIO<IRasterIO>>(Bitmaps().GetBitmapIO(oBitmaps));
    }
    void DeleteBitmap(unsigned int nBitmap) override { Bitmaps().DeleteBitmap(nBitmap); }
    unsigned int CreateBitmap() override { return Bitmaps().CreateBitmap(); }
    std::string GetBitmapDescription(unsigned int nBitmap) const override
    {
        return Bitmaps().GetBitmapDescription(nBitmap);
    }
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override
    {
        Bitmaps().SetBitmapDescription(nBitmap, oDescription);
    }
    MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override { return Bitmaps().GetBitmapMetadata(nBitmap); }
    void SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata) override
    {
        Bitmaps().SetBitmapMetadata(nBitmap, oMetadata);
    }
    IOverviewManager* GetBitmapOverviewManager() override
    {
        return Wrap<ProbedManager>(Bitmaps().GetBitmapOverviewManager());
    }

private:
    template <class Interface>
    static Interface& Facet(Interface* poFacet)
    {
        if (poFacet == nullptr)
            throw krv::DataException("The decorated dataset has no such facet");
        return *poFacet;
    }

    IRasterDataset& Raster(std::source_location oCall = std::source_location::current()) const
    {
        moProbe.Enter(oCall.function_name());
        return Facet(mpoRaster);
    }
    IBitmapDataset& Bitmaps(std::source_location oCall = std::source_location::current()) const
    {
        moProbe.Enter(oCall.function_name());
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
