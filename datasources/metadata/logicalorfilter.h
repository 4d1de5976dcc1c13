#pragma once

#include "datasources/metadata/imetadatafilter.h"

#include <memory>

namespace krv::qrfutils
{

namespace detail
{
class FilterList;
}

// Selects an entry when some child does; without children none. The children are asked in the order in which they were
// added, until one selects.
// A copy shares the list of children with its source: a child added to one is a child of both.
// The children are the filter's own and go with the last copy. Any thread may evaluate.
class KRV_DATASOURCES_API LogicalOrFilter : public IMetadataFilter
{
public:
    // Without children.
    LogicalOrFilter();
    // Takes over the filter, also when it throws. Throws DataException for a null filter.
    explicit LogicalOrFilter(IMetadataFilter* poFirst);
    LogicalOrFilter(const LogicalOrFilter& oOther);
    LogicalOrFilter& operator=(const LogicalOrFilter& oOther);
    ~LogicalOrFilter() override;

    // Takes over the filter, also when it throws. Throws DataException for a null filter. Not while others evaluate.
    void PushBack(IMetadataFilter* poFilter);
    bool operator()(const std::string& key, const std::string& value) const override;

private:
    std::shared_ptr<detail::FilterList> mpoChildren;
};

} // namespace krv::qrfutils
