#include "plugins/support/sidecar/sidecars.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/windowedio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "gobs/raster/datatype.h"
#include "plugins/support/file/newfile.h"
#include "plugins/support/sidecar/levelsfile.h"
#include "plugins/support/sidecar/modelsidecars.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "plugins/support/sidecar/worldfile.h"
#include "toolkit/core/core.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <system_error>
#include <utility>

namespace krv::plugins::support
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IRasterDataset;
using krv::datasources::MetadataMap;
using krv::ogc::cs::GeocodingInfo;
using krv::ogc::cs::ICRS;

namespace
{

constexpr char PROJECTION[] = ".prj";
constexpr char MASK_FLAGS[] = "INTERNAL_MASK_FLAGS_"; // and the number of the mask
constexpr unsigned int FLAG_ALL_VALID = 1;
constexpr unsigned int FLAG_OF_IMAGE = 2;
constexpr unsigned int WRITTEN_MODEL = 1;
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
    // oChange: called before each change.
    MaskIO(std::unique_ptr<krv::datasources::IRasterIO> poBytes, std::function<void()> oChange)
        : mpoBytes(std::move(poBytes)), moChange(std::move(oChange))
    {
    }
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
        moChange();
        std::vector<unsigned char> oBytes(std::size_t{oRect.mnWidth} * oRect.mnHeight);
        for (std::size_t nRow = 0; nRow < oRect.mnHeight; ++nRow)
            std::transform(pSource + nRow * nPitch, pSource + nRow * nPitch + oRect.mnWidth,
                           &oBytes[nRow * oRect.mnWidth],
                           [](unsigned char nByte) -> unsigned char { return nByte != 0 ? 255 : 0; });
        mpoBytes->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oBytes.data());
    }

    std::unique_ptr<krv::datasources::IRasterIO> mpoBytes;
    std::function<void()> moChange;
};

// One that cannot be changed is read, and refuses changes itself.
std::unique_ptr<krv::datasources::IDataset> OpenForUpdate(const std::string& fileName)
{
    auto* const poManager = krv::datasources::DatasetManager::GetInstance();
    try
    {
        return std::unique_ptr<krv::datasources::IDataset>(poManager->Open(fileName, eUpdate));
    }
    catch (const Exception&)
    {
        return std::unique_ptr<krv::datasources::IDataset>(poManager->Open(fileName, eReadOnly));
    }
}

// The generic format says why not.
bool HasUsableLevels(const std::string& fileName)
{
    auto* const poManager = krv::datasources::DatasetManager::GetInstance();
    return std::unique_ptr<krv::datasources::IDataset>(poManager->OpenFormat("GDBALL", fileName, eReadOnly)) != nullptr;
}

// A zone would be taken for validity by others.
[[noreturn]] void RefuseZone(const std::string& fileName)
{
    throw DataException(fileName + ": " + NO_ZONES);
}

// All of its pixels valid.
void FillChannel(IRasterDataset& oMasks, unsigned int nChannel)
{
    const std::unique_ptr<krv::datasources::IRasterIO> poIO(oMasks.GetRasterIO({nChannel}));
    const unsigned int nStep = std::min(poIO->GetTileHeight(), poIO->GetFileHeight());
    std::vector<unsigned char> oRows(std::size_t{poIO->GetFileWidth()} * nStep, 255);
    for (unsigned int nY = 0; nY < poIO->GetFileHeight(); nY += std::min(nStep, poIO->GetFileHeight() - nY))
        poIO->WriteWindow(0u, nY, poIO->GetFileWidth(), std::min(nStep, poIO->GetFileHeight() - nY), oRows.data());
}

// Whether the generic format has the file open for update, and so its levels, which it marks itself.
bool IsWatched(const std::string& fileName)
{
    const auto IsGeneric = [](std::FILE* pFile, void*)
    {
        return fpTestFlag(pFile, eGenericFile) != 0;
    };
    std::FILE* pFile = nullptr;
    return fpCompare(fileName, "r+", &pFile, IsGeneric, nullptr);
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
    moAuxXmlName = FindAppended(moFileName, AUX_XML_ENDING);
    if (moAuxXmlName.empty())
        return *moAuxXml;
    try
    {
        moAuxXml = AuxXml(ReadSidecar(moAuxXmlName, MOST_XML_BYTES), moAuxXmlName, mnChannels);
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

void Sidecars::LoadMasks()
{
    if (moMaskName)
        return;
    moMaskName = mbNone ? std::string() : FindAppended(moFileName, MASK_ENDING);
    if (moMaskName->empty())
        return;
    std::error_code oNone;
    if (std::filesystem::equivalent(moFileName, *moMaskName, oNone))
        return Complain(*moMaskName, "it is the image itself");
    try
    {
        mpoMask.reset(krv::datasources::DatasetManager::GetInstance()->Open(*moMaskName, eReadOnly));
        const std::string fault = FindMasks();
        if (fault.empty())
            return;
        Complain(*moMaskName, "it " + fault);
    }
    catch (const Exception& oError)
    {
        Complain(*moMaskName, oError.what());
    }
    moMasks.clear();
    mpoMask.reset();
}

std::string Sidecars::FindMasks()
{
    const auto* const poRaster = dynamic_cast<IRasterDataset*>(mpoMask.get());
    const unsigned int nMasks = poRaster != nullptr ? poRaster->GetChanCount() : 0;
    if (nMasks == 0)
        return "holds no image";
    if (poRaster->GetWidth() != mnWidth || poRaster->GetHeight() != mnHeight)
        return "is of " + std::to_string(poRaster->GetWidth()) + " x " + std::to_string(poRaster->GetHeight()) +
               " pixels, the image of " + std::to_string(mnWidth) + " x " + std::to_string(mnHeight);
    if (nMasks != 1 && nMasks != mnChannels)
        return "has masks of " + std::to_string(nMasks) + " channels, the image has " + std::to_string(mnChannels);
    for (unsigned int nMask = 1; nMask <= nMasks; ++nMask)
        if (std::unique_ptr<krv::datasources::IChannelInfo>(poRaster->GetChannelInfo(nMask))->GetDataType() !=
            krv::gobs::DataType(krv::gobs::eDT_8U))
            return "is not of bytes";
    const AuxiliaryData oTags = mpoMask->ReadAuxiliaryData();
    const auto GetFlags = [&oTags](unsigned int nMask)
    {
        const std::string text = oTags.GetFileMetadataValue(MASK_FLAGS + std::to_string(nMask));
        return krv::ParseNumber<unsigned int>(text).value_or(0);
    };
    const bool bByChannel = nMasks > 1 && (GetFlags(1) & FLAG_OF_IMAGE) == 0;
    for (unsigned int nMask = 1; nMask <= (bByChannel ? nMasks : 1); ++nMask)
        if ((GetFlags(nMask) & FLAG_ALL_VALID) == 0)
            moMasks.push_back({nMask, bByChannel ? nMask : 0});
    return {};
}

std::vector<unsigned int> Sidecars::ListMasks()
{
    LoadMasks();
    std::vector<unsigned int> oNumbers;
    for (const Mask& oMask : moMasks)
        oNumbers.push_back(oMask.mnNumber);
    return oNumbers;
}

bool Sidecars::HasMask(unsigned int nMask)
{
    LoadMasks();
    return std::any_of(moMasks.begin(), moMasks.end(), [nMask](const Mask& oMask) { return oMask.mnNumber == nMask; });
}

unsigned int Sidecars::FindMaskChannel(unsigned int nMask) const
{
    return std::find_if(moMasks.begin(), moMasks.end(), [nMask](const Mask& oMask) { return oMask.mnNumber == nMask; })
        ->mnChannel;
}

std::string Sidecars::DescribeMask(unsigned int nMask)
{
    if (IsZone(nMask))
        return "Bitmap " + std::to_string(nMask);
    const unsigned int nChannel = HasMask(nMask) ? FindMaskChannel(nMask) : 0;
    return nChannel == 0 ? "" : krv::datasources::NameChannelMask(nChannel);
}

MetadataMap Sidecars::GetMaskTags(unsigned int nMask)
{
    const unsigned int nChannel = HasMask(nMask) ? FindMaskChannel(nMask) : 0;
    if (nChannel == 0)
        return {};
    return {{krv::datasources::VALIDITY_OF_CHANNEL, std::to_string(nChannel)}};
}

krv::datasources::IRasterIO* Sidecars::OpenMask(unsigned int nMask, bool bWrite)
{
    if (!HasMask(nMask))
        throw DataException(moFileName + ": no mask " + std::to_string(nMask) + " lies beside it");
    if (IsZone(nMask) && IsByChannel())
        RefuseZone(moFileName);
    if (mbMaskMade)
        MakeMaskFile();
    else if (bWrite && !mbMaskWritten)
    {
        mpoMask.reset();
        mpoMask = OpenForUpdate(*moMaskName);
        mbMaskWritten = true;
    }
    const auto Change = [this]
    {
        mbMaskChanged = true;
    };
    const unsigned int nChannel = std::max(1u, FindMaskChannel(nMask));
    return new MaskIO(
        std::unique_ptr<krv::datasources::IRasterIO>(dynamic_cast<IRasterDataset&>(*mpoMask).GetRasterIO({nChannel})),
        Change);
}

unsigned int Sidecars::MakeMask()
{
    LoadMasks();
    if (!moMasks.empty() && (moZone || !mbMaskMade || !IsByChannel()))
        throw DataException(moFileName +
                            ": validity masks lie beside the file already, and there is no place for other bitmaps");
    // Numbers of channels are those of their masks, once the file is read again.
    const unsigned int nMask = moMasks.empty() ? 1 : std::max(mnChannels, moMasks.back().mnNumber) + 1;
    moMasks.push_back({nMask, 0});
    moZone = nMask;
    mbMaskMade = mbMaskWritten = mbMaskChanged = true;
    return nMask;
}

void Sidecars::DeclareMask(unsigned int nChannel)
{
    const unsigned int nOwner = mnChannels == 1 && nChannel == 1 ? 0 : nChannel;
    const bool bTaken = std::any_of(moMasks.begin(), moMasks.end(),
                                    [nOwner](const Mask& oMask)
                                    { return oMask.mnChannel != 0 && (nOwner == 0 || oMask.mnChannel == nOwner); });
    const bool bLaidOut = mpoMask != nullptr && moMasks.size() == 1; // as the one of the image
    if (!moZone || nOwner > mnChannels || bTaken || (nOwner != 0 && bLaidOut))
        throw DataException(moFileName + ": a mask of " +
                            (nChannel == 0 ? "the image" : "channel " + std::to_string(nChannel)) +
                            " has no place beside the file");
    moMasks.back().mnChannel = nOwner;
    moZone.reset();
}

void Sidecars::MakeMaskFile()
{
    if (mpoMask)
        return;
    const std::string name = moFileName + MASK_ENDING;
    mpoMask.reset(
        krv::datasources::DatasetManager::GetInstance()->NewDataset(name, "TIF", "COMPRESS=DEFLATE INTERLEAVE=BAND"));
    auto* const poRaster = dynamic_cast<IRasterDataset*>(mpoMask.get());
    if (poRaster == nullptr)
        throw DataException(name + ": a mask cannot be made");
    poRaster->Create(
        mnWidth, mnHeight,
        std::vector<krv::gobs::DataType>(IsByChannel() ? mnChannels : 1, krv::gobs::DataType(krv::gobs::eDT_8U)));
    moMaskName = name;
}

// Says which masks there are; channels without one are valid, whoever reads the file.
void Sidecars::CompleteMaskFile()
{
    MakeMaskFile();
    const unsigned int nMasks = IsByChannel() ? mnChannels : 1;
    AuxiliaryData oTags(nMasks);
    for (unsigned int nMask = 1; nMask <= nMasks; ++nMask)
    {
        const bool bOwn =
            !IsByChannel() || std::any_of(moMasks.begin(), moMasks.end(),
                                          [nMask](const Mask& oMask) { return oMask.mnChannel == nMask; });
        const unsigned int nFlags = !IsByChannel() ? FLAG_OF_IMAGE : bOwn ? 0 : FLAG_ALL_VALID;
        oTags.SetFileMetadataValue(MASK_FLAGS + std::to_string(nMask), std::to_string(nFlags));
        if (!bOwn)
            FillChannel(dynamic_cast<IRasterDataset&>(*mpoMask), nMask);
    }
    mpoMask->WriteAuxiliaryData(oTags);
    mbMaskMade = false;
}

void Sidecars::DropZone()
{
    if (moMasks.size() == 1)
        return DropMasks();
    moMasks.pop_back();
    moZone.reset();
}

// One that was just made goes without a trace.
void Sidecars::DropMasks()
{
    if (ListMasks().empty())
        return;
    if (mpoMask)
        mpoMask->Delete();
    mpoMask.reset();
    moMaskName.emplace();
    moMasks.clear();
    moZone.reset();
    mbMaskMade = mbMaskWritten = mbMaskChanged = false;
}

std::vector<unsigned int> Sidecars::ListModels() const
{
    std::vector<unsigned int> oList = mbNone ? std::vector<unsigned int>() : FindModelSidecars(moFileName);
    if (moModel && (oList.empty() || oList.front() != WRITTEN_MODEL))
        oList.insert(oList.begin(), WRITTEN_MODEL);
    return oList;
}

unsigned int Sidecars::SetModel(const krv::mathmodel::RpcCoefficients& oModel)
{
    moModel = oModel;
    return WRITTEN_MODEL;
}

krv::mathmodel::RpcCoefficients Sidecars::ReadModel(unsigned int nModel) const
{
    return moModel && nModel == WRITTEN_MODEL ? *moModel : ReadModelSidecar(moFileName, nModel);
}

void Sidecars::SetAuxXml(AuxXml oAuxXml)
{
    LoadAuxXml();
    if (const auto oTrouble = moTroubles.find(moAuxXmlName); oTrouble != moTroubles.end())
    {
        if (oAuxXml.IsEmpty())
            return;
        throw DataException(moAuxXmlName + " is not replaced, since it cannot be used: " + oTrouble->second +
                            "; remove it first");
    }
    moAuxXml = std::move(oAuxXml);
    mbAuxXmlChanged = true;
    mbForgotten = false;
}

// Before the first pixel is in the file, and so not when the file is stored: a program that is killed in between leaves
// no levels that pass for those of what it wrote.
void Sidecars::ForgetLevelsBeside()
{
    if (mbLevelsForgotten)
        return;
    mbLevelsForgotten = true;
    const std::string levels = mbNone ? std::string() : FindAppended(moFileName, LEVELS_ENDING);
    if (levels.empty() || IsWatched(moFileName) || !HasUsableLevels(moFileName))
        return;
    try
    {
        const std::unique_ptr<krv::datasources::IDataset> poLevels(
            krv::datasources::DatasetManager::GetInstance()->Open(levels, eUpdate));
        ForgetLevels(*poLevels);
        poLevels->Close();
    }
    catch (const Exception& oError)
    {
        krv::nspio::Warning::Warn(levels + " is outdated, and cannot be marked so: " + oError.GetMessage() +
                                  "; remove it");
    }
}

void Sidecars::ForgetPixels()
{
    ForgetLevelsBeside();
    if (mbForgotten)
        return;
    AuxXml oAuxXml = LoadAuxXml();
    const bool bCurrent = oAuxXml.GetStamp() && oAuxXml.GetStamp() == FindStamp(moFileName);
    if (oAuxXml.DropStatistics() || bCurrent)
        SetAuxXml(std::move(oAuxXml));
    mbForgotten = true;
}

void Sidecars::CheckStore() const
{
    if (moZone)
        RefuseZone(moFileName);
}

bool Sidecars::HoldsChanges() const
{
    return mbMaskChanged || mbAuxXmlChanged || moModel;
}

void Sidecars::Store()
{
    CheckStore();
    mbLevelsForgotten = false;
    if (mbMaskMade)
        CompleteMaskFile();
    if (mbMaskChanged)
        mpoMask->Synchronize();
    mbMaskChanged = false;
    if (moModel)
        WriteModelSidecar(moFileName, *moModel);
    moModel.reset();
    StoreAuxXml();
}

void Sidecars::StoreAuxXml()
{
    if (!mbAuxXmlChanged)
        return;
    if (moAuxXmlName.empty())
        moAuxXmlName = moFileName + AUX_XML_ENDING;
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
    LoadMasks();
    Add(moAuxXmlName, "metadata", oNeeds.mbTags, false);
    if (!moAuxXmlName.empty() && oAuxXml.GetStamp() && oStamp && *oAuxXml.GetStamp() != *oStamp)
        oList.back().moTrouble = "the file changed after it was written";
    Add(FindWorldFile(), "geocoding", oNeeds.mbGeocoding && !oAuxXml.GetGeocoding(), false);
    Add(FindSidecar(moFileName, PROJECTION), "reference system", oNeeds.mbCRS && oAuxXml.GetCRS().empty(), false);
    Add(*moMaskName, "mask", oNeeds.mbMask && !moMasks.empty(), true);
    for (const unsigned int nModel : FindModelSidecars(moFileName))
    {
        const std::string model = FindModelSidecar(moFileName, nModel);
        try
        {
            ReadModelSidecar(moFileName, nModel);
        }
        catch (const krv::Exception& oError)
        {
            moTroubles.emplace(model, oError.what());
        }
        Add(model, "sensor model", oNeeds.mbTags, false);
    }
    const std::string levels = FindAppended(moFileName, LEVELS_ENDING);
    if (!levels.empty() && !HasUsableLevels(moFileName))
        moTroubles.emplace(levels, "it holds no levels of the image");
    Add(levels, "levels", oNeeds.mbLevels, true);
    return oList;
}

} // namespace krv::plugins::support
