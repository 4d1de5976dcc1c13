#pragma once

#include "datasources/reader/ioverviewaccessor.h"

#include <string>

namespace krv::datasources
{

class IRasterWriter;

// Makes and writes the overview levels of a fixed list of channels. A channel is a position in the list, from 1.
// The order of the virtual operations is fixed.
// One thread at a time, that of the writer that it came from.
class KRV_DATASOURCES_API IOverviewWriterAccessor : public IOverviewAccessor
{
public:
    ~IOverviewWriterAccessor() override;

    // A new writer over a level, owned by the caller; accessor and dataset outlive it.
    virtual IRasterWriter* CreateRasterWriter(unsigned int nLevel) = 0;
    // Lays out a level for all channels of the file.
    // Its pixels are 0 and it is not valid until SetValid says so. Throws DataException for a level that exists and for
    // a dataset that is not open for updating.
    virtual void CreateLevel(unsigned int nLevel) = 0;
    // Says whether a channel of a level is up to date. Throws OutOfBoundsException for a position outside the list,
    // DataException for an unknown level and a dataset that is not open for updating.
    virtual void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) = 0;
    // The same for every channel of the list.
    virtual void SetLevelValid(unsigned int nLevel, bool bValid) = 0;
    // NEAREST, AVERAGE, MODE, BILINEAR, CUBIC, LANCZOS, RMS, MIN, MAX or NONE, in any letter case.
    virtual void SetResamplingName(const std::string& oName) = 0;
};

} // namespace krv::datasources
