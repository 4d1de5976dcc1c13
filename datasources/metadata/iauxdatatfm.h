#pragma once

#include "datasources/api.h"

namespace krv::datasources
{
class AuxiliaryData;
}

namespace krv::qrfutils
{

// Makes a new metadata record from a given one. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API IAuxDataTfm
{
public:
    virtual ~IAuxDataTfm();

    // The given record stays as it is. Any thread.
    virtual krv::datasources::AuxiliaryData Transform(const krv::datasources::AuxiliaryData& oData) const = 0;
};

} // namespace krv::qrfutils
