#include "datasources/iomanager/datasetmanager.h"

#include "datasources/formatregistrar/winformatregistrar.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ifileiobuilder.h"
#include "datasources/iomanager/detail/xmlsupport.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "toolkit/core/core.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/described.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <mutex>
#include <utility>

namespace krv::datasources
{

namespace
{

constexpr char SOURCE_FILE[] = "datasources/iomanager/datasetmanager";
constexpr char GENERIC_FORMAT[] = "GDBALL";
constexpr std::size_t HEADER_LENGTH = 4096;

using Header = std::array<unsigned char, HEADER_LENGTH>;

// Set while the instance is made, so that a format library that asks for it meanwhile is told instead of recursing.
bool sbConstructing = false;
// XML support was started for an instance that is not there: for the one being made, or one that could not be made. It
// stays started for the next attempt, since the exception that tells why may be one of the XML library's.
bool sbXmlPending = false;

struct ConstructingGuard
{
    ConstructingGuard() { sbConstructing = true; }
    ~ConstructingGuard() { sbConstructing = false; }
};

// A pipe or a device would wait for data while every other opening waits for this one, and some devices act when they
// are opened.
bool IsSpecial(const struct stat& oStatus)
{
    return !S_ISREG(oStatus.st_mode) && !S_ISBLK(oStatus.st_mode);
}

bool IsSpecialFile(const std::string& name)
{
    struct stat oStatus = {};
    return stat(name.c_str(), &oStatus) == 0 && IsSpecial(oStatus);
}

// As far as the header goes, or the file. The end of a plain file is known without asking for more.
bool ReadHeader(int nFile, const struct stat& oStatus, Header& oHeader)
{
    for (std::size_t nDone = 0; nDone < HEADER_LENGTH;)
    {
        const ssize_t nRead = read(nFile, oHeader.data() + nDone, HEADER_LENGTH - nDone);
        if (nRead < 0 && errno != EINTR)
            return false;
        nDone += static_cast<std::size_t>(std::max<ssize_t>(nRead, 0));
        if (nRead == 0 || (S_ISREG(oStatus.st_mode) && static_cast<off_t>(nDone) >= oStatus.st_size))
            break;
    }
    return true;
}

// The message is an empty text and the place none, by contract.
template <typename Kind>
krv::Described<Kind> Refusal(const std::string& fileName, const std::string& cause)
{
    return krv::Described<Kind>(fileName + ": " + cause, fileName, "", krv::Place::None());
}

std::string WhyUnreadable(const std::string& name)
{
    if (IsSpecialFile(name))
        return "it is a folder or no regular file";
    return access(name.c_str(), R_OK) != 0 ? std::strerror(errno) : "it cannot be read";
}

bool ReadHeader(const std::string& name, Header& oHeader)
{
    struct stat oStatus = {};
    if (stat(name.c_str(), &oStatus) != 0 || IsSpecial(oStatus))
        return false;
    const int nFile = open(name.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (nFile < 0)
        return false;
    const bool bRead = ReadHeader(nFile, oStatus, oHeader);
    close(nFile);
    return bRead;
}

bool IsGenericFile(std::FILE* pFile, void*)
{
    return fpTestFlag(pFile, eGenericFile) != 0;
}

} // namespace

struct DatasetManager::Shared
{
    ~Shared()
    {
        moPrimary.clear();
        moSecondary.clear();
        moCapabilities.clear();
        if (mbHoldsXml)
            detail::LoadXmlSupport().mpTerminate();
    }

    std::vector<std::unique_ptr<IFileIOBuilder>> moPrimary;
    std::vector<std::unique_ptr<IFileIOBuilder>> moSecondary;
    // Guards moCapabilities, and moXmlPaths of every manager; nothing else is locked under it.
    std::mutex moCapabilitiesMutex;
    std::map<std::string, std::unique_ptr<FormatCapabilities>> moCapabilities;
    bool mbHoldsXml = false;
};

DatasetManager* DatasetManager::mpoManager = nullptr;
constinit krv::threading::Mutex DatasetManager::moMutex;

DatasetManager* DatasetManager::GetInstance()
{
    const std::lock_guard oLock(moMutex);
    if (mpoManager != nullptr)
        return mpoManager;
    if (sbConstructing)
        throw krv::DataException("The dataset manager is being made: a format library must not ask for it while it "
                                 "registers");
    // Others need no XML support of this library's.
    if (!sbXmlPending && detail::HasXerces())
    {
        detail::LoadXmlSupport().mpInitialize();
        sbXmlPending = true;
    }
    {
        const ConstructingGuard oGuard;
        mpoManager = new DatasetManager();
    }
    mpoManager->mpoShared->mbHoldsXml = std::exchange(sbXmlPending, false);
    _IMPAtExit(&DatasetManager::DestroyInstance, SOURCE_FILE, 128);
    return mpoManager;
}

void DatasetManager::DestroyInstance()
{
    const std::unique_ptr<DatasetManager> oManager(mpoManager);
    mpoManager = nullptr;
}

DatasetManager::DatasetManager() : mpoShared(std::make_shared<Shared>())
{
    try
    {
        RegisterFormatLibraries(this);
    }
    catch (const krv::Exception& oException)
    {
        krv::nspio::Warning::Warn(oException.GetMessage(), SOURCE_FILE, 506);
        throw;
    }
}

DatasetManager::DatasetManager(const DatasetManager& oOther) = default;
DatasetManager& DatasetManager::operator=(const DatasetManager& oOther) = default;
DatasetManager::~DatasetManager() = default;

void DatasetManager::Register(IFileIOBuilder* poBuilder, const std::string& xmlPath, bool bPrimary)
{
    const std::lock_guard oLock(moMutex);
    if (poBuilder == nullptr)
        throw krv::DataException("A format cannot be registered without a builder");
    const IFileFormat* const poFormat = poBuilder->GetFileFormat();
    if (poFormat == nullptr)
        throw krv::DataException("A format cannot be registered: its builder has no format description");
    const std::string name = poFormat->GetShortName();
    if (moFormatsByName.contains(name))
        throw krv::DataException("Format already registered: short name=" + name, Place::AtLine(201));

    auto& oOwners = bPrimary ? mpoShared->moPrimary : mpoShared->moSecondary;
    moFormatList.reserve(moFormatList.size() + 1);
    oOwners.reserve(oOwners.size() + 1);
    (bPrimary ? moPrimaryBuilders : moSecondaryBuilders)[poFormat] = poBuilder;
    {
        const std::lock_guard oPathsLock(mpoShared->moCapabilitiesMutex);
        moXmlPaths[name] = xmlPath;
    }
    moFormatsByName[name] = poFormat;
    moFormatList.push_back(poFormat);
    oOwners.emplace_back(poBuilder);
}

IDataset* DatasetManager::Open(const std::string& fileName, AccessMode eMode)
{
    const std::lock_guard oLock(moMutex);
    std::FILE* pFile = nullptr;
    if (fpCompare(fileName, eMode == eUpdate ? "r+" : "r", &pFile, &IsGenericFile, nullptr))
        return OpenFormat(GENERIC_FORMAT, fileName, eMode);
    return OpenLocked(fileName, eMode);
}

// Two attempts always: with the name as given and as the operating system knows it.
IDataset* DatasetManager::OpenLocked(const std::string& fileName, AccessMode eMode)
{
    const std::string mungedName = IMPMunge(fileName);
    bool bRead = false;
    for (const std::string* pName : {&fileName, &mungedName})
    {
        Header oHeader{};
        bRead = ReadHeader(*pName, oHeader) || bRead;
        bool bFound = false;
        IDataset* const poDataset = OpenRecognised(*pName, oHeader.data(), eMode, bFound);
        if (bFound)
            return poDataset;
    }
    if (!bRead)
        throw Refusal<krv::FileNotFoundException>(mungedName, WhyUnreadable(mungedName));
    throw Refusal<krv::FileFormatException>(mungedName, "no format recognises it");
}

IDataset* DatasetManager::OpenRecognised(const std::string& name, const unsigned char* pHeader, AccessMode eMode,
                                         bool& bFound)
{
    bFound = true;
    if (mpoLastBuilder != nullptr && mpoLastBuilder->Identify(name, pHeader, HEADER_LENGTH, 0) == 0)
        return mpoLastBuilder->Open(name, eMode);
    for (const BuilderMap* poBuilders : {&moPrimaryBuilders, &moSecondaryBuilders})
    {
        IFileIOBuilder* const poBuilder = FindBuilder(*poBuilders, name, pHeader);
        if (poBuilder == nullptr)
            continue;
        mpoLastBuilder = poBuilder;
        return poBuilder->Open(name, eMode);
    }
    bFound = false;
    return nullptr;
}

IFileIOBuilder* DatasetManager::FindBuilder(const BuilderMap& oBuilders, const std::string& name,
                                            const unsigned char* pHeader)
{
    for (const auto& [poFormat, poBuilder] : oBuilders)
    {
        if (poBuilder == nullptr || poBuilder == mpoLastBuilder)
            continue;
        if (poBuilder->Identify(name, pHeader, HEADER_LENGTH, 0) == 0)
            return poBuilder;
    }
    return nullptr;
}

IFileIOBuilder* DatasetManager::FindBuilder(const IFileFormat* poFormat) const
{
    for (const BuilderMap* poBuilders : {&moPrimaryBuilders, &moSecondaryBuilders})
    {
        const auto oFound = poBuilders->find(poFormat);
        if (oFound != poBuilders->end() && oFound->second != nullptr)
            return oFound->second;
    }
    return nullptr;
}

// Primary builders are not looked at, intended: this is the way to the generic builder.
IDataset* DatasetManager::OpenFormat(const std::string& shortName, const std::string& fileName, AccessMode eMode)
{
    const auto oFormat = moFormatsByName.find(shortName);
    if (oFormat == moFormatsByName.end())
        return nullptr;
    const auto oBuilder = moSecondaryBuilders.find(oFormat->second);
    if (oBuilder == moSecondaryBuilders.end() || oBuilder->second == nullptr)
        return nullptr;
    try
    {
        return oBuilder->second->Open(fileName, eMode);
    }
    catch (const krv::Exception&)
    {
        return nullptr;
    }
}

IDataset* DatasetManager::NewDataset(const std::string& fileName, const std::string& fileType,
                                     const std::string& options)
{
    const std::lock_guard oLock(moMutex);
    const std::string name = IMPMunge(fileName);
    std::string formatName = krv::core::FType2FormatName(fileType);
    std::string formatOptions = options;
    auto oFormat = moFormatsByName.find(formatName);
    if (oFormat == moFormatsByName.end())
    {
        formatName = GENERIC_FORMAT;
        formatOptions = "FTYPE:" + fileType + " " + options;
        oFormat = moFormatsByName.find(formatName);
    }
    if (oFormat == moFormatsByName.end())
        throw krv::DataException("Invalid file format type specified for file creation, " + fileType, Place::None());

    if (GetCapabilities(formatName).IsSupported(CAPABILITY_CREATE))
    {
        if (IFileIOBuilder* const poBuilder = FindBuilder(oFormat->second))
            return poBuilder->Create(name, formatOptions);
    }
    return Open(name, eUpdate);
}

bool DatasetManager::CanOpen(const std::string& fileName, AccessMode eMode)
{
    try
    {
        const std::unique_ptr<IDataset> oDataset(Open(fileName, eMode));
        return true;
    }
    catch (const krv::Exception&)
    {
        return false;
    }
}

const IFileFormat* DatasetManager::GetFormatByName(const std::string& shortName) const
{
    const std::lock_guard oLock(moMutex);
    const auto oFound = moFormatsByName.find(ToUpper(shortName));
    if (oFound == moFormatsByName.end())
        throw krv::DataException("Format not found: short name=" + shortName, Place::AtLine(437));
    return oFound->second;
}

const std::vector<const IFileFormat*>& DatasetManager::GetFormatList() const
{
    return moFormatList;
}

const FormatCapabilities& DatasetManager::GetCapabilities(const std::string& shortName) const
{
    const std::lock_guard oLock(mpoShared->moCapabilitiesMutex);
    auto& oCache = mpoShared->moCapabilities;
    auto oFound = oCache.find(shortName);
    if (oFound == oCache.end())
    {
        auto oCapabilities = std::make_unique<FormatCapabilities>(GetXMLPath(shortName));
        oFound = oCache.emplace(shortName, std::move(oCapabilities)).first;
    }
    return *oFound->second;
}

std::string DatasetManager::GetXMLPath(const std::string& shortName) const
{
    const auto oFound = moXmlPaths.find(shortName);
    if (oFound == moXmlPaths.end())
        throw krv::Exception("the format: " + shortName + " is not registred in the DatasetManager.",
                             Place::AtLine(468));
    return oFound->second;
}

bool DatasetManager::FileExists(const std::string& fileName) const
{
    struct stat oStatus;
    return stat(IMPMunge(fileName).c_str(), &oStatus) == 0;
}

} // namespace krv::datasources
