#include "datasources/interfaces/ifileformat.h"

#include <utility>

namespace krv::datasources
{

ABSFileFormat::ABSFileFormat() = default;

ABSFileFormat::ABSFileFormat(const std::vector<std::string>& oExtensions, std::string shortName)
    : moExtensions(oExtensions), moShortName(std::move(shortName))
{
}

ABSFileFormat::ABSFileFormat(const ABSFileFormat& oOther) = default;
ABSFileFormat::~ABSFileFormat() = default;
ABSFileFormat& ABSFileFormat::operator=(const ABSFileFormat& oOther) = default;

void ABSFileFormat::Assignment(const ABSFileFormat& oOther)
{
    *this = oOther;
}

std::vector<std::string> ABSFileFormat::GetExtensions() const
{
    return moExtensions;
}

std::string ABSFileFormat::GetShortName() const
{
    return moShortName;
}

} // namespace krv::datasources
