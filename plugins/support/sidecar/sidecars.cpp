#include "plugins/support/sidecar/sidecars.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/windowedio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "gobs/raster/datatype.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "plugins/support/sidecar/worldfile.h"
#include "plugins/support/writing/newfile.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdio>

namespace krv::plugins::support
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IRasterDataset;
using krv::datasources::MetadataMap;
using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::ICRS;

namespace
{

constexpr char AUX_XML[] = ".aux.xml";
constexpr char MASK[] = ".msk";
constexpr char PROJECTION[] = ".prj";
constexpr char NO_DATA[] = "NO_DATA_VALUE";
constexpr std::size_t MOST_TEXT_BYTES = std::size_t{1} << 20;
constexpr std::size_t MOST_XML_BYTES = std::size_t{16} << 20;

bool IsSidecarName(const std::string& fileName)
{
    const std::string name = krv::ToUpper(fileName);
    return name.ends_with(".MSK") || name.ends_with(".OVR") || name.ends_with(".AUX.XML");
}

std::optional<AuxXml::Stamp> FindStamp(const std::string& fileName)
{
    struct stat oStatus = {};
    if (::stat(fileName.c_str(), &oStatus) != 0)
        return std::nullopt;
    return AuxXml::Stamp{static_cast<std::uint64_t>(oStatus.st_size),
                         std::int64_t{oStatus.st_mtim.tv_sec} * 1000000000 + oStatus.st_mtim.tv_nsec};
}

// Any byte but 0 is a valid pixel.
class MaskIO : public krv::datasources::WindowedIO<krv::datasources::IRasterIO>
{
public:
    explicit MaskIO(std::unique_ptr<krv::datasources::IRasterIO> poBytes) : mpoBytes(std::move(poBytes)) {}
    ~MaskIO() override = default;

    unsigned int GetFileWidth() const override { return mpoBytes->GetFileWidth(); }
    unsigned int GetFileHeight() const override { return mpoBytes->GetFileHeight(); }
    unsigned int GetTileWidth() const override { return mpoBytes->GetTileWidth(); }
    unsigned int GetTileHeight() const override { return mpoBytes->GetTileHeight(); }

private:
    std::size_t GetPixelBytes() const override { return 1; }
    void ReadPixels(const krv::datasources::PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override
    {
        std::vector<unsigned char> oBytes(std::size_t{oRect.mnWidth} * oRect.mnHeight);
        mpoBytes->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oBytes.data());
        for (std::size_t nRow = 0; nRow < oRect.mnHeight; ++nRow)
            std::transform(&oBytes[nRow * oRect.mnWidth], &oBytes[nRow * oRect.mnWidth] + oRect.mnWidth,
                           pTarget + nRow * nPitch, [](unsigned char nByte) { return nByte != 0 ? 1 : 0; });
    }
    void WritePixels(const krv::datasources::PixelRect& oRect, const unsigned char* pSource,
                     std::size_t nPitch) override
    {
        std::vector<unsigned char> oBytes(std::size_t{oRect.mnWidth} * oRect.mnHeight);
        for (std::size_t nRow = 0; nRow < oRect.mnHeight; ++nRow)
            std::transform(pSource + nRow * nPitch, pSource + nRow * nPitch + oRect.mnWidth,
                           &oBytes[nRow * oRect.mnWidth],
                           [](unsigned char nByte) -> unsigned char { return nByte != 0 ? 255 : 0; });
        mpoBytes->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oBytes.data());
    }

    std::unique_ptr<krv::datasources::IRasterIO> mpoBytes;
};

// Why a file is no mask of an image; empty when it is one.
std::string FindMaskFault(krv::datasources::IDataset* poMask, unsigned int nWidth, unsigned int nHeight)
{
    auto* const poRaster = dynamic_cast<IRasterDataset*>(poMask);
    if (poRaster == nullptr || poRaster->GetChanCount() == 0)
        return "holds no image";
    if (poRaster->GetWidth() != nWidth || poRaster->GetHeight() != nHeight)
        return "is of " + std::to_string(poRaster->GetWidth()) + " x " + std::to_string(poRaster->GetHeight()) +
               " pixels, the image of " + std::to_string(nWidth) + " x " + std::to_string(nHeight);
    if (poRaster->GetChanCount() != 1)
        return "has a mask for each of several channels";
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(poRaster->GetChannelInfo(1));
    return poInfo->GetDataType() == krv::gobs::DataType(krv::gobs::eDT_8U) ? "" : "is not of bytes";
}

void AddMissing(const MetadataMap& oFrom, MetadataMap& oTo, bool bNoData)
{
    for (const auto& [key, value] : oFrom)
        if (krv::ToUpper(key) != NO_DATA || bNoData)
            oTo.emplace(key, value);
}

} // namespace

Sidecars::Sidecars(const std::string& fileName, unsigned int nWidth, unsigned int nHeight, unsigned int nChannels,
                   bool bNew)
    : moFileName(fileName), mnWidth(nWidth), mnHeight(nHeight), mnChannels(nChannels),
      mbNone(bNew || IsSidecarName(fileName))
{
}

Sidecars::~Sidecars() = default;

bool Sidecars::IsOlder(const std::string& sidecar) const
{
    const auto oImage = FindStamp(moFileName), oOther = FindStamp(sidecar);
    return oImage && oOther && oOther->mnTime < oImage->mnTime;
}

void Sidecars::Complain(const std::string& sidecar, const std::string& trouble)
{
    if (moTroubles.emplace(sidecar, trouble).second)
        krv::nspio::Warning::Warn(sidecar + " is not used: " + trouble);
}

const AuxXml& Sidecars::LoadAuxXml()
{
    if (moAuxXml)
        return *moAuxXml;
    moAuxXml.emplace(mnChannels);
    if (mbNone)
        return *moAuxXml;
    moAuxXmlName = FindAppended(moFileName, AUX_XML);
    if (moAuxXmlName.empty())
        return *moAuxXml;
    try
    {
        moAuxXml.emplace(ReadSidecar(moAuxXmlName, MOST_XML_BYTES), moAuxXmlName, mnChannels);
    }
    catch (const Exception& oError)
    {
        Complain(moAuxXmlName, oError.GetMessage());
    }
    return *moAuxXml;
}

std::string Sidecars::FindWorldFile() const
{
    for (const std::string& ending : mbNone ? std::vector<std::string>() : ListWorldEndings(moFileName))
        if (std::string found = FindSidecar(moFileName, ending); !found.empty())
            return found;
    return {};
}

std::optional<GeocodingInfo> Sidecars::ReadGeocoding()
{
    if (const auto& oInfo = LoadAuxXml().GetGeocoding())
        return oInfo;
    const std::string world = FindWorldFile();
    if (world.empty())
        return std::nullopt;
    try
    {
        if (const auto oInfo = ParseWorldFile(ReadSidecar(world, MOST_TEXT_BYTES)))
            return oInfo;
        Complain(world, "it does not hold six numbers of a transform");
    }
    catch (const FileException& oError)
    {
        Complain(world, oError.GetMessage());
    }
    return std::nullopt;
}

std::unique_ptr<ICRS> Sidecars::ReadCRS()
{
    std::string name, definition = LoadAuxXml().GetCRS();
    if (!definition.empty())
        name = moAuxXmlName;
    try
    {
        if (name.empty())
            name = mbNone ? std::string() : FindSidecar(moFileName, PROJECTION);
        if (name.empty())
            return nullptr;
        if (definition.empty())
            definition = ReadSidecar(name, MOST_TEXT_BYTES);
        return krv::ogc::cs::CreateCRSFromWKT(definition);
    }
    catch (const Exception& oError)
    {
        Complain(name, oError.GetMessage());
        return nullptr;
    }
}

void Sidecars::AddTags(AuxiliaryData& oRecord)
{
    const AuxiliaryData& oTags = LoadAuxXml().GetTags();
    if (LoadAuxXml().IsEmpty())
        return;
    const bool bFileNoData = !oRecord.GetFileMetadataValue(NO_DATA).empty();
    MetadataMap oFile = oRecord.GetFileMetadata();
    AddMissing(oTags.GetFileMetadata(), oFile, true);
    oRecord.SetFileMetadata(oFile);
    for (unsigned int nChannel = 1; nChannel <= std::min(mnChannels, oRecord.GetChannelCount()); ++nChannel)
    {
        MetadataMap oMap = oRecord.GetChanMetadata(nChannel);
        AddMissing(oTags.GetChanMetadata(nChannel), oMap, !bFileNoData);
        oRecord.SetChanMetadata(oMap, nChannel);
        if (oRecord.GetChannelDescription(nChannel).empty())
            oRecord.SetChannelDescription(oTags.GetChannelDescription(nChannel), nChannel);
    }
}

bool Sidecars::HasMask()
{
    if (moMaskName)
        return mpoMask != nullptr;
    moMaskName = mbNone ? std::string() : FindAppended(moFileName, MASK);
    if (moMaskName->empty())
        return false;
    try
    {
        mpoMask.reset(krv::datasources::DatasetManager::GetInstance()->Open(*moMaskName, eReadOnly));
        const std::string fault = FindMaskFault(mpoMask.get(), mnWidth, mnHeight);
        if (fault.empty())
            return true;
        Complain(*moMaskName, "it " + fault);
    }
    catch (const Exception& oError)
    {
        Complain(*moMaskName, oError.what());
    }
    mpoMask.reset();
    return false;
}

krv::datasources::IRasterIO* Sidecars::OpenMask(bool bWrite)
{
    if (!HasMask())
        throw DataException(moFileName + ": no mask lies beside it");
    if (bWrite && !mbMaskWritten)
    {
        mpoMask.reset();
        mpoMask.reset(krv::datasources::DatasetManager::GetInstance()->Open(*moMaskName, eUpdate));
        mbMaskWritten = true;
    }
    return new MaskIO(
        std::unique_ptr<krv::datasources::IRasterIO>(dynamic_cast<IRasterDataset&>(*mpoMask).GetRasterIO({1})));
}

void Sidecars::MakeMask()
{
    if (HasMask())
        throw DataException(moFileName + ": a mask lies beside it already");
    const std::string name = moFileName + MASK;
    mpoMask.reset(krv::datasources::DatasetManager::GetInstance()->NewDataset(name, "TIF", "COMPRESS=DEFLATE"));
    auto* const poRaster = dynamic_cast<IRasterDataset*>(mpoMask.get());
    if (poRaster == nullptr)
        throw DataException(name + ": a mask cannot be made");
    poRaster->Create(mnWidth, mnHeight, {krv::gobs::DataType(krv::gobs::eDT_8U)});
    AuxiliaryData oTags(1);
    oTags.SetFileMetadataValue("INTERNAL_MASK_FLAGS_1", "2");
    mpoMask->WriteAuxiliaryData(oTags);
    moMaskName = name;
    mbMaskWritten = true;
}

// One that was just made goes without a trace.
void Sidecars::DropMask()
{
    if (!HasMask())
        return;
    mpoMask->Delete();
    mpoMask.reset();
    moMaskName.emplace();
    mbMaskWritten = false;
}

void Sidecars::StoreMask()
{
    if (mpoMask && mbMaskWritten)
        mpoMask->Synchronize();
}

void Sidecars::SetAuxXml(AuxXml oAuxXml)
{
    LoadAuxXml();
    moAuxXml = std::move(oAuxXml);
    mbAuxXmlChanged = true;
}

void Sidecars::StoreAuxXml()
{
    if (!mbAuxXmlChanged)
        return;
    if (moAuxXmlName.empty())
        moAuxXmlName = moFileName + AUX_XML;
    if (moAuxXml->IsEmpty())
        std::remove(moAuxXmlName.c_str());
    else
    {
        if (const auto oStamp = FindStamp(moFileName))
            moAuxXml->SetStamp(*oStamp);
        const std::string text = moAuxXml->Write();
        NewFile oNew(moAuxXmlName, true);
        oNew.GetFile()->Write(0, text.data(), text.size());
        oNew.GetFile()->Flush();
        oNew.TakeName(true);
    }
    mbAuxXmlChanged = false;
}

std::vector<krv::datasources::Sidecar> Sidecars::List(const Needs& oNeeds)
{
    std::vector<krv::datasources::Sidecar> oList;
    const auto Add = [&](const std::string& name, const char* pSays, bool bUsed, bool bOfPixels)
    {
        if (name.empty())
            return;
        const auto oTrouble = moTroubles.find(name);
        std::string trouble = oTrouble == moTroubles.end() ? std::string() : oTrouble->second;
        const bool bFaulty = !trouble.empty();
        if (!bFaulty && bOfPixels && IsOlder(name))
            trouble = "it is older than the file";
        oList.push_back({name, pSays, bUsed && !bFaulty, trouble});
    };
    if (mbNone)
        return oList;
    const AuxXml& oAuxXml = LoadAuxXml();
    const auto oStamp = FindStamp(moFileName);
    ReadGeocoding();
    ReadCRS();
    HasMask();
    Add(moAuxXmlName, "metadata", oNeeds.mbTags, false);
    if (!moAuxXmlName.empty() && oAuxXml.GetStamp() && oStamp && *oAuxXml.GetStamp() != *oStamp)
        oList.back().moTrouble = "the file changed after it was written";
    Add(FindWorldFile(), "geocoding", oNeeds.mbGeocoding && !oAuxXml.GetGeocoding(), false);
    Add(FindSidecar(moFileName, PROJECTION), "reference system", oNeeds.mbCRS && oAuxXml.GetCRS().empty(), false);
    Add(*moMaskName, "mask", oNeeds.mbMask && mpoMask != nullptr, true);
    for (const char* const pEnding : {"_RPC.TXT", ".rpb"})
        Add(FindSidecar(moFileName, pEnding), "sensor model", oNeeds.mbTags, false);
    Add(FindAppended(moFileName, ".ovr"), "levels", true, true);
    return oList;
}

} // namespace krv::plugins::support
