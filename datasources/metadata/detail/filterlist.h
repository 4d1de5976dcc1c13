#pragma once

#include "datasources/metadata/imetadatafilter.h"
#include "toolkit/exceptions/place.h"

#include <boost/shared_ptr.hpp>

#include <memory>
#include <vector>

namespace krv::qrfutils::detail
{

// The children of a logical filter, in the order of their adding.
class FilterList
{
public:
    using Filter = boost::shared_ptr<IMetadataFilter>;

    // A new list that holds one filter.
    static std::shared_ptr<FilterList> Holding(IMetadataFilter* poFirst,
                                               const krv::Place& oPlace = krv::Place::Current());

    // Takes over the filter, also when it throws. Throws DataException for a null filter.
    void PushBack(IMetadataFilter* poFilter, const krv::Place& oPlace = krv::Place::Current());

    const std::vector<Filter>& GetFilters() const { return moFilters; }

private:
    void Append(const Filter& poFilter, const krv::Place& oPlace);

    std::vector<Filter> moFilters;
};

} // namespace krv::qrfutils::detail
