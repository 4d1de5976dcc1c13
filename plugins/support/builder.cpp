#include "plugins/support/builder.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::plugins::support
{

FormatDescription::FormatDescription(const std::string& description, const std::vector<std::string>& oExtensions,
                                     const std::string& shortName)
    : ABSFileFormat(oExtensions, shortName), moDescription(description)
{
}

FormatDescription::~FormatDescription() = default;

Builder::Builder(const std::string& description, const std::vector<std::string>& oExtensions,
                 const std::string& shortName)
    : moFormat(description, oExtensions, shortName)
{
}

Builder::~Builder() = default;

krv::datasources::IDataset* Builder::Create(const std::string& fileName, const std::string&)
{
    throw DataException(fileName + ": the format " + moFormat.GetShortName() + " cannot create files");
}

void Builder::CheckReadOnly(const std::string& fileName, AccessMode eMode, const Place& oPlace) const
{
    if (eMode == eUpdate)
        throw DataException(
            fileName + ": the format " + moFormat.GetShortName() + " cannot update files; open it read-only", oPlace);
}

void Builder::RefuseOptions(const std::string& fileName, const std::string& options, const Place& oPlace) const
{
    if (options.find_first_not_of(' ') != std::string::npos)
        throw DataException(fileName + ": the format " + moFormat.GetShortName() + " has no options, not " + options,
                            oPlace);
}

void Builder::DescribeOptions(const std::vector<Options::Description>& oOptions)
{
    std::vector<krv::datasources::FormatOption> oList;
    for (const Options::Description& oOption : oOptions)
        oList.push_back({oOption.moKey, oOption.moTakes});
    moFormat.SetOptions(std::move(oList));
}

} // namespace krv::plugins::support
