#pragma once

#include "datasources/api.h"

#include <string>

namespace krv::qrfutils
{

// A predicate over one metadata entry. Filters may be evaluated by several threads at once. The order of the virtual
// operations is public and fixed.
// Used by AuxiliaryData::GetFilteredMeta, which leaves the selected entries out.
class KRV_DATASOURCES_API IMetadataFilter
{
public:
    virtual ~IMetadataFilter();

    // Whether the filter selects the entry.
    virtual bool operator()(const std::string& key, const std::string& value) const = 0;
};

} // namespace krv::qrfutils
