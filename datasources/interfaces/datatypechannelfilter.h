#pragma once

#include "datasources/interfaces/ichannelfilter.h"
#include "gobs/raster/datatype.h"

namespace krv::datasources
{

// Accepts the channels of exactly one data type, all six fields compared.
// Example: BasicReader oReader("scene.tif", DataTypeChannelFilter(eDT_16U)) reads all channels of 16 bits.
class KRV_DATASOURCES_API DataTypeChannelFilter : public IChannelFilter
{
public:
    // The type is copied; it need not be one of the table. Any thread may ask.
    explicit DataTypeChannelFilter(const krv::gobs::DataType& oType);
    DataTypeChannelFilter(const DataTypeChannelFilter&);
    DataTypeChannelFilter& operator=(const DataTypeChannelFilter&);
    ~DataTypeChannelFilter() override;

    // Asks the virtual one-channel form, so that a derived filter's rule applies.
    std::vector<unsigned int> Accept(const IRasterDataset& oDataset) const override;
    bool Accept(const IRasterDataset& oDataset, unsigned int nChannel) const override;

private:
    krv::gobs::DataType moType;
};

} // namespace krv::datasources
