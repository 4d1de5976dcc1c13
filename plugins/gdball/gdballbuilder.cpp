#include "plugins/gdball/gdballbuilder.h"

#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/formatcapabilities.h"
#include "plugins/gdball/genericdataset.h"
#include "plugins/gdball/pictures/picturemodule.h"
#include "plugins/support/file/file.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "toolkit/core/core.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>
#include <memory>
#include <optional>

namespace krv::plugins::gdball
{

using namespace krv::datasources;

namespace
{

constexpr char NAME[] = "GDBALL";
constexpr char NATIVE[] = "KRVDSK";
constexpr std::string_view FILE_TYPE = "FTYPE:";

// For update, or for reading where the format can do no more.
std::unique_ptr<IDataset> OpenByManager(const std::string& fileName, AccessMode eMode)
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

// "name[page=2]": a page of an animation or a book of pictures, unless a file has that very name.
struct PictureName
{
    std::string moFile;
    unsigned int mnPage = 0; // none is named

    explicit PictureName(const std::string& name) : moFile(name)
    {
        constexpr std::string_view PAGE = "[page=";
        const std::size_t nAt = name.rfind(PAGE);
        if (nAt == std::string::npos || !name.ends_with(']'))
            return;
        const std::size_t nNumber = nAt + PAGE.size();
        const auto oPage = krv::ParseNumber<unsigned int>(name.substr(nNumber, name.size() - 1 - nNumber));
        if (!oPage || *oPage == 0 || *oPage > INT_MAX || krv::core::fileio::File(name).Exists())
            return;
        mnPage = *oPage;
        moFile.resize(nAt);
    }
};

std::optional<PictureKind> FindKind(const std::string& fileName)
{
    unsigned char aHeader[4096];
    const support::File oFile(fileName, support::File::Mode::eRead);
    return FindPictureKind(aHeader, oFile.ReadUpTo(0, aHeader, sizeof(aHeader)));
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
            if (krv::ToUpper(extension) == type && poFormat->GetShortName() != NAME)
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
    return all + (HasPictures() ? ", " + ListPictureTypes() : "");
}

std::string Describe()
{
    return HasPictures() ? "Pictures, by libvips; levels beside files in .ovr"
                         : "Levels beside files in .ovr (built without libvips, so without pictures)";
}

std::vector<std::string> ListExtensions()
{
    return HasPictures() ? ListPictureExtensions() : std::vector<std::string>();
}

} // namespace

GdballBuilder::GdballBuilder() : Builder(Describe(), ListExtensions(), NAME)
{
    if (HasPictures())
        DescribeOptions({{"FTYPE:<type>", "first: the type of the new file, a format or " + ListPictureTypes()},
                         {"COMPRESSION", "of PNG: a number from 0 to 9"},
                         {"QUALITY", "of JPEG, and of WEBP, which is lossless without: a number from 1 to 100"},
                         {"PROGRESSIVE", "of JPEG: YES, NO"}});
}

GdballBuilder::~GdballBuilder() = default;

int GdballBuilder::Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength, int)
{
    const bool bPicture = FindPictureKind(pHeader, nHeaderLength) || PictureName(fileName).mnPage != 0;
    return HasPictures() && bPicture ? 0 : 1;
}

std::unique_ptr<IDataset> GdballBuilder::OpenImage(const std::string& fileName, AccessMode eMode)
{
    const PictureName oName(fileName);
    if (HasPictures())
        if (const auto oKind = FindKind(oName.moFile))
            return std::unique_ptr<IDataset>(
                GetPictureModule(oName.moFile)
                    .mpOpen(oName.moFile, *oKind, std::max(1u, oName.mnPage), GetFileFormat()));
    return OpenByManager(fileName, eMode);
}

bool GdballBuilder::IsPicture(const std::string& fileName)
{
    return HasPictures() && FindKind(PictureName(fileName).moFile).has_value();
}

IDataset* GdballBuilder::Open(const std::string& fileName, AccessMode eMode)
{
    const PictureName oName(fileName);
    if (oName.mnPage == 1)
        return Open(oName.moFile, eMode);
    if (auto poShared = SharedImage::Find(fileName, eMode))
        return new GenericDataset(std::move(poShared));
    const bool bLevels = !support::FindAppended(fileName, ".ovr").empty();
    const bool bPicture = IsPicture(fileName);
    if (bPicture && !bLevels && eMode != eUpdate)
        return OpenImage(fileName, eMode).release();
    const auto Refuse = [&fileName](const char* pWhy)
    {
        throw FileFormatException(fileName, fileName + ": " + pWhy);
    };
    if (oName.mnPage != 0 && !bPicture)
        throw DataException(oName.moFile + ": has no pages: it is no picture");
    if ((!bLevels && eMode != eUpdate) || krv::ToUpper(fileName).ends_with(".OVR"))
        Refuse("is no picture, and no levels lie beside it");
    std::unique_ptr<IDataset> poImage = OpenImage(fileName, eMode);
    if (!bLevels && HoldsLevels(*poImage))
        Refuse("holds its levels itself");
    const auto poShared = std::make_shared<SharedImage>(fileName, std::move(poImage), eMode);
    if (eMode == eUpdate)
        SharedImage::Enter(poShared);
    else if (!poShared->GetLevels().IsOpen())
    {
        if (bPicture)
            return OpenImage(fileName, eMode).release();
        Refuse("what lies beside it are no levels of it");
    }
    return new GenericDataset(poShared);
}

IDataset* GdballBuilder::Create(const std::string& fileName, const std::string& options)
{
    const std::size_t nDot = fileName.rfind('.');
    const auto oByName = FindPictureType(nDot == std::string::npos ? "" : krv::ToUpper(fileName.substr(nDot + 1)));
    if (!options.starts_with(FILE_TYPE) && HasPictures() && oByName)
        return GetPictureModule(fileName).mpCreate(fileName, *oByName, options, GetFileFormat());
    if (!options.starts_with(FILE_TYPE))
        throw DataException(fileName + ": a new file is of a type that the format is asked for by: " +
                            std::string(FILE_TYPE) + "<type>, of " + ListCreating());
    const std::size_t nBlank = std::min(options.find(' '), options.size());
    const std::string type = krv::ToUpper(options.substr(FILE_TYPE.size(), nBlank - FILE_TYPE.size()));
    const std::string rest = options.substr(std::min(nBlank + 1, options.size()));
    if (type == NAME)
        throw DataException(fileName + ": " + NAME + " is no type of files");
    const IFileFormat* const poFormat = FindFormat(type);
    const auto oKind = HasPictures() ? FindPictureType(type) : std::nullopt;
    if (poFormat == nullptr && oKind)
        return GetPictureModule(fileName).mpCreate(fileName, *oKind, rest, GetFileFormat());
    if (poFormat == nullptr && type == NATIVE)
        throw DataException(fileName + ": files of the type " + NATIVE + " need its plug-in, which is not installed");
    if (poFormat == nullptr || poFormat->GetShortName() == NAME || !Creates(*poFormat))
        throw DataException(fileName + ": no format makes files of the type \"" + type + "\"; there are " +
                            ListCreating());
    return DatasetManager::GetInstance()->NewDataset(fileName, poFormat->GetShortName(), rest);
}

} // namespace krv::plugins::gdball
