#include "datasources/metadata/logicalorfilter.h"

#include "datasources/metadata/detail/filterlist.h"

namespace krv::qrfutils
{

LogicalOrFilter::LogicalOrFilter() : mpoChildren(std::make_shared<detail::FilterList>()) {}

LogicalOrFilter::LogicalOrFilter(IMetadataFilter* poFirst) : mpoChildren(detail::FilterList::Holding(poFirst)) {}

LogicalOrFilter::LogicalOrFilter(const LogicalOrFilter& oOther) = default;

LogicalOrFilter& LogicalOrFilter::operator=(const LogicalOrFilter& oOther) = default;

LogicalOrFilter::~LogicalOrFilter() = default;

void LogicalOrFilter::PushBack(IMetadataFilter* poFilter)
{
    mpoChildren->PushBack(poFilter);
}

bool LogicalOrFilter::operator()(const std::string& key, const std::string& value) const
{
    for (const auto& poChild : mpoChildren->GetFilters())
    {
        if ((*poChild)(key, value))
            return true;
    }
    return false;
}

} // namespace krv::qrfutils
