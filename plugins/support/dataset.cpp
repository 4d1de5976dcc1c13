#include "plugins/support/dataset.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/support/image/rasterio.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>

#include <sys/stat.h>

namespace krv::plugins::support
{

Dataset::Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : moName(fileName), mpoFormat(poFormat), mpoCache(std::make_shared<BlockCache>(BlockCache::Sharing::eByOrigin))
{
}

Dataset::Dataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<FileWriter> poWriter)
    : Dataset(poWriter->GetFileName(), poFormat)
{
    mpoWriter = std::move(poWriter);
    mpoCache = std::make_shared<BlockCache>();
}

Dataset::~Dataset()
{
    Abandon();
}

void Dataset::SetImage(std::shared_ptr<IBlockSource> poSource)
{
    mpoImage = std::make_shared<BlockImage>(std::move(poSource), mpoCache);
}

void Dataset::Refuse(const std::string& what, const Place& oPlace) const
{
    throw DataException(moName + ": " + what, oPlace);
}

void Dataset::Abandon() const noexcept
{
    if (!WritesBeside())
        return;
    try
    {
        const Place oPlace = Place::Current();
        const bool bUnsaved = (mpoWriter && mpoWriter->HasUnsaved()) || (mpoSidecars && mpoSidecars->HoldsChanges());
        if (bUnsaved && std::uncaught_exceptions() <= mnExceptions)
            krv::nspio::Warning::Warn(moName +
                                          ": the dataset goes without Synchronize or Close; what was written since "
                                          "the last one is lost",
                                      oPlace);
    }
    catch (...)
    {
        // A sink that throws has been told.
    }
    if (mpoWriter)
        mpoWriter->Discard();
    mpoSidecars.reset();
}

void Dataset::CheckWritingBeside(const char* pWhat, const Place& oPlace) const
{
    CheckOpen(oPlace);
    if (!mbSidecarsWritten)
        CheckWriting(pWhat, oPlace);
}

void Dataset::CheckWriting(const char* pWhat, const Place& oPlace) const
{
    CheckOpen(oPlace);
    if (!mpoWriter)
        Refuse(std::string("the file is open for reading only: ") + pWhat, oPlace);
    if (!mpoWriter->HasFile())
        Refuse("the dataset has no image yet", oPlace);
}

void Dataset::CheckCreate(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes,
                          const Place& oPlace, bool bEmpty) const
{
    CheckOpen(oPlace);
    if (!mpoWriter || HasImage())
        Refuse("an image exists already", oPlace);
    if (nWidth == 0 || nHeight == 0 || nWidth > INT_MAX || nHeight > INT_MAX || (oTypes.empty() && !bEmpty))
        Refuse("an image of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) + " pixels and " +
                   std::to_string(oTypes.size()) + " channels cannot be laid out",
               oPlace);
}

void Dataset::KeepExisting()
{
    if (mpoWriter)
        mpoWriter->KeepExisting();
}

void Dataset::WatchStoring(Watch oWatch)
{
    if (mpoWriter)
        mpoWriter->SetWatch(std::move(oWatch));
}

bool Dataset::KeepsPixels() const
{
    GetImage();
    return true;
}

void Dataset::CheckOpen(const Place& oPlace) const
{
    if (!mbOpen)
        Refuse("the dataset is closed", oPlace);
}

const std::shared_ptr<BlockImage>& Dataset::GetImage(const Place& oPlace) const
{
    CheckOpen(oPlace);
    if (!mpoImage)
        Refuse("the dataset has no image yet", oPlace);
    return mpoImage;
}

const ImageLayout& Dataset::GetLayout(const Place& oPlace) const
{
    return GetImage(oPlace)->GetLayout();
}

Sidecars& Dataset::GetSidecars() const
{
    const ImageLayout& oLayout = GetLayout();
    if (!mpoSidecars)
        mpoSidecars = std::make_unique<Sidecars>(moName, oLayout.GetWidth(), oLayout.GetHeight(),
                                                 oLayout.GetChannelCount(), mpoWriter && !mpoWriter->IsNamed());
    return *mpoSidecars;
}

std::vector<krv::datasources::Sidecar> Dataset::ListSidecars()
{
    if (!HasImage())
        return {};
    Sidecars::Needs oNeeds = GetNeeds();
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(GetOverviewManager());
    oNeeds.mbLevels = poLevels == nullptr || poLevels->GetLevels().empty();
    return GetSidecars().List(oNeeds);
}

void Dataset::ForgetPixelsBeside()
{
    if (IsNamed())
        GetSidecars().ForgetPixels();
}

void Dataset::BeginSidecars()
{
    GetSidecars();
    mbSidecarsWritten = true;
}

void Dataset::CheckLacking(bool bLacking, const char* pWhat, const Place& oPlace) const
{
    CheckWritingBeside(pWhat, oPlace);
    if (!bLacking)
        Refuse(std::string(pWhat) +
                   ": the file itself says it, and its format cannot change it; a copy in another format can",
               oPlace);
}

// What the record has and the sidecar has not is the file's own.
void Dataset::WriteTagsBeside(const krv::datasources::AuxiliaryData& oData)
{
    using krv::datasources::MetadataMap;
    const Place oPlace = Place::Current();
    constexpr const char* WHAT = "metadata cannot be written";
    CheckLacking(true, WHAT, oPlace);
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
                   std::to_string(GetChanCount()),
               oPlace);
    const krv::datasources::AuxiliaryData oShown = ReadAuxiliaryData();
    AuxXml oAuxXml = GetSidecars().GetAuxXml();
    krv::datasources::AuxiliaryData oTags = oData, oBeside = oAuxXml.GetTags();
    const auto TakeOwn = [&](const MetadataMap& oAll, const MetadataMap& oThere, MetadataMap oNew)
    {
        for (const auto& [key, value] : oAll)
        {
            const auto oFound = oThere.find(key);
            const auto oWanted = oNew.find(key);
            if (oFound != oThere.end() && oFound->second == value)
                continue;
            CheckLacking(oWanted != oNew.end() && oWanted->second == value, WHAT, oPlace);
            oNew.erase(key);
        }
        return oNew;
    };
    oTags.SetFileMetadata(TakeOwn(oShown.GetFileMetadata(), oBeside.GetFileMetadata(), oData.GetFileMetadata()));
    for (unsigned int nChannel = 1; nChannel <= GetChanCount(); ++nChannel)
    {
        oTags.SetChanMetadata(TakeOwn(oShown.GetChanMetadata(nChannel), oBeside.GetChanMetadata(nChannel),
                                      oData.GetChanMetadata(nChannel)),
                              nChannel);
        const std::string own = oShown.GetChannelDescription(nChannel);
        const bool bOwn = !own.empty() && own != oBeside.GetChannelDescription(nChannel);
        CheckLacking(!bOwn || own == oData.GetChannelDescription(nChannel), WHAT, oPlace);
        if (bOwn)
            oTags.SetChannelDescription("", nChannel);
    }
    oAuxXml.SetTags(oTags);
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

void Dataset::WriteCRSBeside(const krv::ogc::cs::ICRS& oCRS)
{
    CheckLacking(GetNeeds().mbCRS, "the reference system cannot be written", Place::Current());
    AuxXml oAuxXml = GetSidecars().GetAuxXml();
    oAuxXml.SetCRS(oCRS.GetWKT());
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

void Dataset::WriteGeocodingBeside(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    CheckLacking(GetNeeds().mbGeocoding, "the geocoding cannot be written", oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    AuxXml oAuxXml = GetSidecars().GetAuxXml();
    oAuxXml.SetGeocoding(oInfo);
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

void Dataset::RemoveCRSBeside()
{
    CheckLacking(GetNeeds().mbCRS, "the reference system cannot be removed", Place::Current());
    ForgetCRSBeside();
}

void Dataset::RemoveGeocodingBeside()
{
    CheckLacking(GetNeeds().mbGeocoding, "the geocoding cannot be removed", Place::Current());
    ForgetGeocodingBeside();
}

// A tag of the file itself that hides one beside is not removed with it: the record never showed that one.
void Dataset::ForgetTagsBeside(const krv::datasources::AuxiliaryData& oNew)
{
    using krv::datasources::MetadataMap;
    AuxXml oAuxXml = GetSidecars().GetAuxXml();
    if (oAuxXml.IsEmpty())
        return;
    const krv::datasources::AuxiliaryData oShown = ReadAuxiliaryData();
    krv::datasources::AuxiliaryData oTags = oAuxXml.GetTags();
    bool bAny = false;
    const auto Empty = [&bAny](MetadataMap oBeside, const MetadataMap& oBefore, const MetadataMap& oAfter)
    {
        for (auto& [key, value] : oBeside)
        {
            const auto oWas = oBefore.find(key), oIs = oAfter.find(key);
            if (value.empty() || oWas == oBefore.end() || oWas->second != value ||
                (oIs != oAfter.end() && !oIs->second.empty()))
                continue;
            value.clear();
            bAny = true;
        }
        return oBeside;
    };
    oTags.SetFileMetadata(Empty(oTags.GetFileMetadata(), oShown.GetFileMetadata(), oNew.GetFileMetadata()));
    for (unsigned int nChannel = 1; nChannel <= std::min(GetChanCount(), oNew.GetChannelCount()); ++nChannel)
    {
        oTags.SetChanMetadata(
            Empty(oTags.GetChanMetadata(nChannel), oShown.GetChanMetadata(nChannel), oNew.GetChanMetadata(nChannel)),
            nChannel);
        const std::string beside = oTags.GetChannelDescription(nChannel);
        if (beside.empty() || beside != oShown.GetChannelDescription(nChannel) ||
            !oNew.GetChannelDescription(nChannel).empty())
            continue;
        oTags.SetChannelDescription("", nChannel);
        bAny = true;
    }
    if (!bAny)
        return;
    oAuxXml.SetTags(oTags);
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

void Dataset::ForgetCRSBeside()
{
    AuxXml oAuxXml = GetSidecars().GetAuxXml();
    if (oAuxXml.GetCRS().empty())
        return;
    oAuxXml.SetCRS({});
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

void Dataset::ForgetGeocodingBeside()
{
    AuxXml oAuxXml = GetSidecars().GetAuxXml();
    if (!oAuxXml.GetGeocoding())
        return;
    oAuxXml.SetGeocoding(std::nullopt);
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

krv::datasources::FileAccessState Dataset::Delete()
{
    if (mpoWriter)
        mpoWriter->Discard();
    Close();
    if (mpoWriter && !mpoWriter->IsNamed())
        return krv::datasources::eDone;
    const std::vector<std::string> oCompanions = ListCompanions(moName);
    if (std::remove(moName.c_str()) == 0)
    {
        for (const std::string& companion : oCompanions)
            std::remove(companion.c_str());
        return krv::datasources::eDone;
    }
    return errno == ENOENT ? krv::datasources::eNotFound : krv::datasources::eDenied;
}

bool Dataset::Exists() const
{
    struct stat oStatus = {};
    return mpoWriter && !mpoWriter->IsNamed() ? mpoWriter->HasFile() : ::stat(moName.c_str(), &oStatus) == 0;
}

krv::datasources::AuxiliaryData Dataset::ReadAuxiliaryData()
{
    return krv::datasources::AuxiliaryData(GetChanCount());
}

void Dataset::WriteAuxiliaryData(const krv::datasources::AuxiliaryData&)
{
    Refuse("metadata cannot be written");
}

krv::ogc::cs::ICRS* Dataset::ReadCRS() const
{
    return nullptr;
}

void Dataset::UpdateCRS(const krv::ogc::cs::ICRS&) const
{
    Refuse("the reference system cannot be written");
}

bool Dataset::IsLinked() const
{
    return false;
}

void Dataset::Synchronize()
{
    CheckOpen();
    Store(false);
}

// The file first: what lies beside is to be younger than it.
void Dataset::Store(bool bLast)
{
    if (mpoSidecars)
        mpoSidecars->CheckStore();
    if (mpoWriter && bLast)
        mpoWriter->Finish();
    else if (mpoWriter)
        mpoWriter->Synchronize();
    if (mpoSidecars && WritesBeside())
        mpoSidecars->Store();
}

void Dataset::Close()
{
    if (mbOpen && (!mpoWriter || !mpoWriter->IsEnded()))
        Store(true);
    mbOpen = false;
    mbSidecarsWritten = false;
    mpoSidecars.reset();
    mpoImage.reset();
}

krv::datasources::IRasterIO* Dataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    return new RasterIO(GetImage(), oChannels);
}

void Dataset::AddNewChannel(const krv::gobs::RasterInfo&)
{
    Refuse("channels cannot be added");
}

void Dataset::DeleteChannel(unsigned int)
{
    Refuse("channels cannot be deleted");
}

void Dataset::Create(unsigned int, unsigned int, const std::vector<krv::gobs::DataType>&)
{
    Refuse("an image cannot be laid out");
}

void Dataset::Create(const krv::gobs::RasterInfo& oInfo)
{
    Create(oInfo.GetWidth(), oInfo.GetHeight(),
           std::vector<krv::gobs::DataType>(oInfo.GetChansCount(), oInfo.GetDataType()));
}

unsigned int Dataset::GetWidth() const
{
    return GetLayout().GetWidth();
}

unsigned int Dataset::GetHeight() const
{
    return GetLayout().GetHeight();
}

unsigned int Dataset::GetChanCount() const
{
    return GetLayout().GetChannelCount();
}

krv::datasources::IChannelInfo* Dataset::GetChannelInfo(unsigned int nChannel) const
{
    const Plane& oPlane = GetLayout().GetChannelPlane(nChannel);
    return new krv::datasources::ChannelInfo(oPlane.moNativeType, oPlane.moType);
}

krv::datasources::IHistoryIO* Dataset::GetHistoryIO(unsigned int)
{
    return nullptr;
}

krv::datasources::IOverviewManager* Dataset::GetOverviewManager()
{
    return nullptr;
}

krv::datasources::AccessCapabilities Dataset::GetRasterCapabilities()
{
    return {true, mpoWriter != nullptr, mpoWriter != nullptr};
}

} // namespace krv::plugins::support
