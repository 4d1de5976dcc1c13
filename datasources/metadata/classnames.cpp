#include "datasources/metadata/classnames.h"

#include "toolkit/core/numbertext.h"

#include <sstream>
#include <string_view>

namespace krv::datasources
{

namespace
{

constexpr std::string_view PREFIX = "CLASS_NAME_";
constexpr char LIST[] = "class names";
constexpr char AROUND[] = " \t\r\n{}";

std::string Trim(const std::string& text)
{
    const std::size_t nFirst = text.find_first_not_of(AROUND);
    return nFirst == std::string::npos ? std::string()
                                       : text.substr(nFirst, text.find_last_not_of(AROUND) - nFirst + 1);
}

} // namespace

std::string MakeClassNameKey(unsigned int nValue)
{
    return std::string(PREFIX) + std::to_string(nValue);
}

std::optional<unsigned int> ParseClassNameKey(const std::string& key)
{
    if (!key.starts_with(PREFIX))
        return std::nullopt;
    return krv::ParseNumber<unsigned int>(std::string_view(key).substr(PREFIX.size()));
}

std::map<unsigned int, std::string> GetClassNames(const AuxiliaryData& oRecord, unsigned int nChannel)
{
    std::map<unsigned int, std::string> oNames;
    if (nChannel == 0 || nChannel > oRecord.GetChannelCount())
        return oNames;
    for (const auto& [key, value] : oRecord.GetChanMetadata(nChannel))
        if (const auto oValue = ParseClassNameKey(key); oValue && !value.empty())
            oNames[*oValue] = value;
    if (!oNames.empty() || oRecord.GetChannelCount() != 1)
        return oNames;
    std::istringstream oList(oRecord.GetFileMetadataValue(LIST));
    unsigned int nValue = 0;
    for (std::string name; std::getline(oList, name, ','); ++nValue)
        if (const std::string trimmed = Trim(name); !trimmed.empty())
            oNames[nValue] = trimmed;
    return oNames;
}

} // namespace krv::datasources
