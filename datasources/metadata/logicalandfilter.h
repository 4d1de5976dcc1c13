#pragma once

#include "datasources/metadata/imetadatafilter.h"

#include <memory>

namespace krv::qrfutils
{

namespace detail
{
class FilterList;
}

// Selects an entry when every child does; without children every entry. The children are asked in the order in which
// they were added, until one declines.
// A copy shares the list of children with its source: a child added to one is a child of both.
// The children are the filter's own and go with the last copy. Any thread may evaluate.
class KRV_DATASOURCES_API LogicalAndFilter : public IMetadataFilter
{
public:
    // Without children.
    LogicalAndFilter();
    // Takes over the filter, also when it throws. Throws DataException for a null filter.
    explicit LogicalAndFilter(IMetadataFilter* poFirst);
    LogicalAndFilter(const LogicalAndFilter& oOther);
    LogicalAndFilter& operator=(const LogicalAndFilter& oOther);
    ~LogicalAndFilter() override;

    // Takes over the filter, also when it throws. Throws DataException for a null filter. Not while others evaluate.
    void PushBack(IMetadataFilter* poFilter);
    bool operator()(const std::string& key, const std::string& value) const override;

private:
    std::shared_ptr<detail::FilterList> mpoChildren;
};

} // namespace krv::qrfutils
