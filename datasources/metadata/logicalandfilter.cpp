#include "datasources/metadata/logicalandfilter.h"

#include "datasources/metadata/detail/filterlist.h"

namespace krv::qrfutils
{

LogicalAndFilter::LogicalAndFilter() : mpoChildren(std::make_shared<detail::FilterList>()) {}

LogicalAndFilter::LogicalAndFilter(IMetadataFilter* poFirst) : mpoChildren(detail::FilterList::Holding(poFirst)) {}

LogicalAndFilter::LogicalAndFilter(const LogicalAndFilter& oOther) = default;

LogicalAndFilter& LogicalAndFilter::operator=(const LogicalAndFilter& oOther) = default;

LogicalAndFilter::~LogicalAndFilter() = default;

void LogicalAndFilter::PushBack(IMetadataFilter* poFilter)
{
    mpoChildren->PushBack(poFilter);
}

bool LogicalAndFilter::operator()(const std::string& key, const std::string& value) const
{
    for (const auto& poChild : mpoChildren->GetFilters())
    {
        if (!(*poChild)(key, value))
            return false;
    }
    return true;
}

} // namespace krv::qrfutils
