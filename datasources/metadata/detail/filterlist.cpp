#include "datasources/metadata/detail/filterlist.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::qrfutils::detail
{

std::shared_ptr<FilterList> FilterList::Holding(IMetadataFilter* poFirst, const krv::Place& oPlace)
{
    const Filter poOwned(poFirst);
    auto poList = std::make_shared<FilterList>();
    poList->Append(poOwned, oPlace);
    return poList;
}

void FilterList::PushBack(IMetadataFilter* poFilter, const krv::Place& oPlace)
{
    Append(Filter(poFilter), oPlace);
}

void FilterList::Append(const Filter& poFilter, const krv::Place& oPlace)
{
    if (poFilter == nullptr)
        throw krv::DataException("The metadata filter is NULL", oPlace);
    moFilters.push_back(poFilter);
}

} // namespace krv::qrfutils::detail
