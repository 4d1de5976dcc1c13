#include "operations/source/sourcefile.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/validitysource.h"
#include "operations/job/exceptions.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <fmt/format.h>

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>

namespace krv::operations
{

using krv::datasources::IOverviewReaderAccessor;
using krv::datasources::IRasterReader;

namespace
{

constexpr char NO_DATA[] = "NO_DATA_VALUE";

// A file whose format does not update files is updated by what lies beside it.
std::unique_ptr<krv::datasources::IDataset> OpenDataset(const std::string& name, AccessMode eMode)
{
    auto* const poManager = krv::datasources::DatasetManager::GetInstance();
    std::unique_ptr<krv::datasources::IDataset> poDataset;
    try
    {
        poDataset.reset(poManager->Open(name, eMode));
    }
    catch (const krv::DataException&)
    {
        if (eMode == eUpdate)
            poDataset.reset(poManager->OpenFormat("GDBALL", name, eMode));
        if (poDataset == nullptr)
            throw;
    }
    if (poDataset == nullptr)
        throw krv::FileFormatException(name, "its format recognised it and then opened nothing");
    return poDataset;
}

std::string LevelList(const IOverviewReaderAccessor& oAccessor)
{
    const auto oLevels = oAccessor.GetLevels();
    return oLevels.empty() ? "the file has none" : fmt::format("there are {}", fmt::join(oLevels, ", "));
}

bool Has(const IOverviewReaderAccessor& oAccessor, unsigned int nLevel)
{
    const auto oLevels = oAccessor.GetLevels();
    return std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end() && oAccessor.IsLevelValid(nLevel);
}

} // namespace

std::string WhyUnreadable(const std::string& file)
{
    struct stat oStatus = {};
    if (stat(file.c_str(), &oStatus) != 0)
    {
        if (errno == ENOENT)
            return "there is no such file; check the name and the folder";
        return std::string("it cannot be reached: ") + std::strerror(errno);
    }
    if (S_ISDIR(oStatus.st_mode))
        return "it is a folder; name a file in it";
    if (!S_ISREG(oStatus.st_mode))
        return "it is not a regular file; copy its content into one";
    if (access(file.c_str(), R_OK) != 0)
        return "it may not be read; ask its owner for the right to read it";
    return {};
}

LevelReader::LevelReader(std::unique_ptr<IRasterReader> poFull, std::unique_ptr<IOverviewReaderAccessor> poAccessor,
                         std::unique_ptr<IRasterReader> poLevel)
    : mpoFull(std::move(poFull)), mpoAccessor(std::move(poAccessor)), mpoLevel(std::move(poLevel))
{
}

LevelReader::LevelReader(LevelReader&&) noexcept = default;
LevelReader::~LevelReader() = default;

SourceFile::Identity::Identity(const std::string& name)
{
    struct stat oStatus = {};
    if (stat(name.c_str(), &oStatus) != 0 || !S_ISREG(oStatus.st_mode))
        return;
    mnDevice = oStatus.st_dev;
    mnNode = oStatus.st_ino;
    mnSize = oStatus.st_size;
    mnSeconds = oStatus.st_mtim.tv_sec;
    mnNanoseconds = oStatus.st_mtim.tv_nsec;
}

LevelReader LevelReader::AtLeast(std::unique_ptr<IRasterReader> poFull, unsigned int nWidth, unsigned int nHeight,
                                 const std::string& name)
{
    std::unique_ptr<IOverviewReaderAccessor> poAccessor(poFull->GetOverviewReaderAccessor());
    std::vector<unsigned int> oLevels = poAccessor != nullptr ? poAccessor->GetLevels() : std::vector<unsigned int>();
    std::sort(oLevels.rbegin(), oLevels.rend());
    for (const unsigned int nLevel : oLevels)
    {
        if (!poAccessor->IsLevelValid(nLevel))
            continue;
        try
        {
            std::unique_ptr<IRasterReader> poLevel(poAccessor->CreateRasterReader(nLevel));
            if (poLevel->GetWidth() >= nWidth && poLevel->GetHeight() >= nHeight)
                return {std::move(poFull), std::move(poAccessor), std::move(poLevel)};
        }
        catch (const krv::Exception&)
        {
            krv::nspio::Warning::Warn(fmt::format("{}: level {} cannot be read: {}", name, nLevel, CurrentMessage()));
        }
    }
    return {std::move(poFull), nullptr, nullptr};
}

SourceFile::SourceFile(const std::string& name, AccessMode eMode, const std::optional<std::string>& noData)
    : moName(name), meMode(eMode), moNoData(noData), moIdentity(name), mpoDataset(OpenDataset(name, eMode)),
      mpoRaster(dynamic_cast<krv::datasources::IRasterDataset*>(mpoDataset.get())),
      moMetadata(mpoDataset->ReadAuxiliaryData())
{
    if (!noData)
        return;
    if (!krv::datasources::ParseNoData(*noData))
        throw RequestException("the no-data value \"" + *noData + "\" is no number");
    moMetadata.SetFileMetadataValue(NO_DATA, *noData);
    for (unsigned int i = 1; i <= moMetadata.GetChannelCount(); ++i)
        if (moMetadata.GetChanMetadata(i).contains(NO_DATA))
            moMetadata.RemoveChanMetadataValue(NO_DATA, i);
    krv::datasources::DropStatistics(moMetadata);
}

SourceFile::~SourceFile() = default;

std::unique_ptr<SourceFile> SourceFile::OpenAgain(bool bUpdated) const
{
    if (moIdentity.mnNode == 0)
        return nullptr;
    try
    {
        auto poAgain = std::make_unique<SourceFile>(moName, eReadOnly, moNoData);
        // What this process writes into a file that it updates changes size and time, not what is opened.
        const Identity oNow(moName);
        const bool bSame = bUpdated || meMode == eUpdate
                               ? oNow.mnNode == moIdentity.mnNode && oNow.mnDevice == moIdentity.mnDevice
                               : poAgain->moIdentity == moIdentity && oNow == moIdentity;
        return bSame ? std::move(poAgain) : nullptr;
    }
    catch (const krv::Exception&)
    {
        return nullptr;
    }
}

std::shared_ptr<IRasterReader> SourceFile::ReadAgain(const std::vector<unsigned int>& oChannels, bool bUpdated) const
{
    struct Held
    {
        std::unique_ptr<SourceFile> file;
        LevelReader reader;
    };
    std::unique_ptr<SourceFile> poAgain = OpenAgain(bUpdated);
    if (poAgain == nullptr)
        return nullptr;
    LevelReader oReader = poAgain->Read(oChannels);
    const auto poHeld = std::make_shared<Held>(std::move(poAgain), std::move(oReader));
    return {poHeld, &poHeld->reader.Get()};
}

krv::datasources::IRasterDataset& SourceFile::GetRaster() const
{
    if (mpoRaster == nullptr || mpoRaster->GetChanCount() == 0)
        throw krv::DataException(moName + ": the file holds no image");
    return *mpoRaster;
}

unsigned int SourceFile::GetChannelCount() const
{
    return GetRaster().GetChanCount();
}

krv::gobs::DataType SourceFile::GetType(unsigned int nChannel) const
{
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(GetRaster().GetChannelInfo(nChannel));
    if (poInfo == nullptr)
        throw krv::DataException(fmt::format("{}: channel {} has no description", moName, nChannel));
    return poInfo->GetDataType();
}

bool SourceFile::IsIdentityPlace(bool bHasCrs) const
{
    return bHasCrs && moMetadata.GetFileMetadataValue("GroundControlPoints").empty() &&
           moMetadata.GetFileMetadataValue("map info").empty();
}

std::string SourceFile::GetNoDataText(unsigned int nChannel) const
{
    return nChannel <= moMetadata.GetChannelCount() ? krv::datasources::GetNoDataText(moMetadata, nChannel)
                                                    : std::string();
}

OptionalNoData SourceFile::GetNoData(unsigned int nChannel) const
{
    const std::string text = GetNoDataText(nChannel);
    const OptionalNoData oValue = krv::datasources::ParseNoData(text);
    if (!text.empty() && !oValue)
        krv::nspio::Warning::Warn(
            fmt::format("{}: the no-data value \"{}\" is no number and is not used", moName, text));
    return oValue;
}

ValueScale SourceFile::GetScale(unsigned int nChannel) const
{
    ValueScale oScale;
    if (nChannel == 0 || nChannel > moMetadata.GetChannelCount())
        return oScale;
    const auto Read = [&](const char* pKey, double nElse)
    {
        const auto oValue = krv::ParseNumber<double>(moMetadata.GetChanMetadataValue(pKey, nChannel));
        return oValue && std::isfinite(*oValue) ? *oValue : nElse;
    };
    oScale.scale = Read("Scale", 1);
    oScale.offset = Read("Offset", 0);
    return oScale.scale == 0 ? ValueScale() : oScale;
}

std::unique_ptr<krv::datasources::ValiditySource> SourceFile::MakeValidity(const std::vector<unsigned int>& oChannels,
                                                                           bool bNoData) const
{
    return std::make_unique<krv::datasources::ValiditySource>(mpoDataset.get(), moMetadata, oChannels,
                                                              krv::gobs::eAllChannels, bNoData);
}

std::vector<unsigned int> SourceFile::CheckChannels(const std::vector<unsigned int>& oChannels) const
{
    const unsigned int nCount = GetChannelCount();
    std::vector<unsigned int> oResult = oChannels;
    for (unsigned int i = 1; oChannels.empty() && i <= nCount; ++i)
        oResult.push_back(i);
    if (oResult.empty())
        throw krv::DataException(moName + ": the file holds no image");
    for (const unsigned int nChannel : oResult)
    {
        if (nChannel == 0 || nChannel > nCount)
            throw RequestException(
                fmt::format("{}: there is no channel {}; {}", moName, nChannel,
                            nCount == 1 ? "it has one" : fmt::format("its channels are 1 to {}", nCount)));
    }
    return oResult;
}

std::vector<ChannelGroup> SourceFile::GroupByType(const std::vector<unsigned int>& oChannels) const
{
    std::vector<ChannelGroup> oGroups;
    std::vector<krv::gobs::DataType> oTypes;
    for (std::size_t i = 0; i < oChannels.size(); ++i)
    {
        const krv::gobs::DataType oType = GetType(oChannels[i]);
        const auto oFound = std::find(oTypes.begin(), oTypes.end(), oType);
        const auto nGroup = static_cast<std::size_t>(oFound - oTypes.begin());
        if (oFound == oTypes.end())
        {
            oTypes.push_back(oType);
            oGroups.emplace_back();
        }
        oGroups[nGroup].channels.push_back(oChannels[i]);
        oGroups[nGroup].positions.push_back(i);
    }
    return oGroups;
}

std::unique_ptr<krv::datasources::BasicReader> SourceFile::ReadFull(const std::vector<unsigned int>& oChannels) const
{
    auto poReader = std::make_unique<krv::datasources::BasicReader>(mpoDataset.get(), oChannels, false);
    const auto& oRaster = GetRaster();
    if (poReader->GetWidth() != oRaster.GetWidth() || poReader->GetHeight() != oRaster.GetHeight())
        throw krv::DataException(fmt::format("{}: the image says to be of {} x {} pixels, its channels of {} x {}",
                                             moName, oRaster.GetWidth(), oRaster.GetHeight(), poReader->GetWidth(),
                                             poReader->GetHeight()));
    return poReader;
}

LevelReader SourceFile::Read(const std::vector<unsigned int>& oChannels, unsigned int nLevel) const
{
    auto poFull = ReadFull(oChannels);
    if (nLevel <= 1)
        return {std::move(poFull), nullptr, nullptr};
    std::unique_ptr<IOverviewReaderAccessor> poAccessor(poFull->GetOverviewReaderAccessor());
    if (poAccessor == nullptr || !Has(*poAccessor, nLevel))
        throw RequestException(fmt::format("{}: there is no level {}; {}", moName, nLevel,
                                           poAccessor == nullptr ? "the file has none" : LevelList(*poAccessor)));
    std::unique_ptr<IRasterReader> poLevel(poAccessor->CreateRasterReader(nLevel));
    return {std::move(poFull), std::move(poAccessor), std::move(poLevel)};
}

LevelReader SourceFile::ReadAtLeast(const std::vector<unsigned int>& oChannels, unsigned int nWidth,
                                    unsigned int nHeight) const
{
    return LevelReader::AtLeast(ReadFull(oChannels), nWidth, nHeight, moName);
}

} // namespace krv::operations
