#include "plugins/gdball/gdballbuilder.h"

#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "plugins/gdball/genericdataset.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <memory>

namespace krv::plugins::gdball
{

using namespace krv::datasources;

namespace
{

constexpr char NAME[] = "GDBALL";
constexpr char NATIVE[] = "KRVDSK";
constexpr std::string_view FILE_TYPE = "FTYPE:";

// For update, or for reading where the format can do no more.
std::unique_ptr<IDataset> OpenImage(const std::string& fileName, AccessMode eMode)
{
    DatasetManager* const poManager = DatasetManager::GetInstance();
    try
    {
        return std::unique_ptr<IDataset>(poManager->Open(fileName, eMode));
    }
    catch (const Exception&)
    {
        if (eMode != eUpdate)
            throw;
    }
    return std::unique_ptr<IDataset>(poManager->Open(fileName, eReadOnly));
}

bool HoldsLevels(IDataset& oDataset)
{
    auto* const poRaster = dynamic_cast<IRasterDataset*>(&oDataset);
    if (poRaster == nullptr || !poRaster->GetRasterCapabilities().IsUpdatable())
        return false;
    return std::unique_ptr<IOverviewManager>(poRaster->GetOverviewManager()) != nullptr;
}

// The format of a type, by its short name or else by an extension.
const IFileFormat* FindFormat(const std::string& type)
{
    const std::vector<const IFileFormat*>& oFormats = DatasetManager::GetInstance()->GetFormatList();
    for (const IFileFormat* const poFormat : oFormats)
        if (krv::ToUpper(poFormat->GetShortName()) == type)
            return poFormat;
    for (const IFileFormat* const poFormat : oFormats)
        for (const std::string& extension : poFormat->GetExtensions())
            if (krv::ToUpper(extension) == type)
                return poFormat;
    return nullptr;
}

bool Creates(const IFileFormat& oFormat)
{
    return DatasetManager::GetInstance()->GetCapabilities(oFormat.GetShortName()).IsSupported(CAPABILITY_CREATE);
}

std::string ListCreating()
{
    std::string all;
    for (const IFileFormat* const poFormat : DatasetManager::GetInstance()->GetFormatList())
        if (poFormat->GetShortName() != NAME && Creates(*poFormat))
            all += (all.empty() ? "" : ", ") + poFormat->GetShortName();
    return all;
}

} // namespace

GdballBuilder::GdballBuilder() : Builder("What lies beside files of other formats: levels in .ovr", {}, NAME) {}

GdballBuilder::~GdballBuilder() = default;

int GdballBuilder::Identify(const std::string&, const unsigned char*, unsigned int, int)
{
    return 1;
}

IDataset* GdballBuilder::Open(const std::string& fileName, AccessMode eMode)
{
    if (auto poShared = SharedImage::Find(fileName, eMode))
        return new GenericDataset(std::move(poShared));
    const bool bLevels = !support::FindAppended(fileName, ".ovr").empty();
    if ((!bLevels && eMode != eUpdate) || krv::ToUpper(fileName).ends_with(".OVR"))
        return nullptr;
    std::unique_ptr<IDataset> poImage = OpenImage(fileName, eMode);
    if (poImage == nullptr || (!bLevels && HoldsLevels(*poImage)))
        return nullptr;
    const auto poShared = std::make_shared<SharedImage>(fileName, std::move(poImage), eMode);
    if (eMode == eUpdate)
        SharedImage::Enter(poShared);
    else if (!poShared->GetLevels().IsOpen())
        return nullptr;
    return new GenericDataset(poShared);
}

IDataset* GdballBuilder::Create(const std::string& fileName, const std::string& options)
{
    if (!options.starts_with(FILE_TYPE))
        throw DataException(fileName + ": a new file is of a type that the format is asked for by: " +
                            std::string(FILE_TYPE) + "<type>, of " + ListCreating());
    const std::size_t nBlank = std::min(options.find(' '), options.size());
    const std::string type = krv::ToUpper(options.substr(FILE_TYPE.size(), nBlank - FILE_TYPE.size()));
    const std::string rest = options.substr(std::min(nBlank + 1, options.size()));
    if (type == NAME)
        throw DataException(fileName + ": " + NAME + " is no type of files");
    const IFileFormat* const poFormat = FindFormat(type);
    if (poFormat == nullptr && type == NATIVE)
        throw DataException(fileName + ": files of the type " + NATIVE + " need its plug-in, which is not installed");
    if (poFormat == nullptr || poFormat->GetShortName() == NAME || !Creates(*poFormat))
        throw DataException(fileName + ": no format makes files of the type \"" + type + "\"; there are " +
                            ListCreating());
    return DatasetManager::GetInstance()->NewDataset(fileName, poFormat->GetShortName(), rest);
}

} // namespace krv::plugins::gdball
