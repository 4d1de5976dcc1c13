#pragma once

#include "datasources/api.h"

namespace krv::datasources
{
class AuxiliaryData;
}

namespace krv::qrfutils
{

// Makes a new metadata record from a given one. The order of the virtual operations is public and fixed.
// A step on the way of a record from one file to another, such as renumbering what it says of channels.
class KRV_DATASOURCES_API IAuxDataTfm
{
public:
    virtual ~IAuxDataTfm();

    // The given record stays as it is. Any thread.
    // Throws krv::Exception where the record cannot be transformed.
    virtual krv::datasources::AuxiliaryData Transform(const krv::datasources::AuxiliaryData& oData) const = 0;
};

} // namespace krv::qrfutils
