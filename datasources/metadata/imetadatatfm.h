#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/metadatamap.h"

namespace krv::qrfutils
{

// Makes new metadata tags from given ones. The order of the virtual operations is public and fixed.
// Of tags of a file or of one channel; IAuxDataTfm is of a whole record.
class KRV_DATASOURCES_API IMetaDataTfm
{
public:
    virtual ~IMetaDataTfm();

    // The given tags stay as they are. Any thread.
    virtual krv::datasources::MetadataMap Transform(const krv::datasources::MetadataMap& oMap) const = 0;
};

} // namespace krv::qrfutils
