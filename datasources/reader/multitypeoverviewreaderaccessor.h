#pragma once

#include "datasources/reader/derived/derivedoverviewreaderaccessor.h"
#include "gobs/raster/datatype.h"

#include <vector>

namespace krv::datasources
{

class IRasterDataset;

// The levels of channels of different types, each read as one image of a type. Levels, validity and metadata are those
// of BasicOverviewReaderAccessor. The dataset outlives the accessor, and the accessor every reader that it makes.
// MultiTypeReader::GetOverviewReaderAccessor gives one.
class KRV_DATASOURCES_API MultiTypeOverviewReaderAccessor : public DerivedOverviewReaderAccessor
{
public:
    // Throws DataException for a null dataset and an empty list.
    // oReadChannels: of the file, from 1. oType: of the rasters of each level.
    MultiTypeOverviewReaderAccessor(IRasterDataset* poRasterDataset, const std::vector<unsigned int>& oReadChannels,
                                    const krv::gobs::DataType& oType);
    ~MultiTypeOverviewReaderAccessor() override;

    // A MultiTypeReader over one reader per channel, which places every channel at its own place.
    IRasterReader* CreateRasterReader(unsigned int nLevel) override;

private:
    IRasterDataset* mpoRasterDataset; // borrowed
    std::vector<unsigned int> moReadChannels;
    krv::gobs::DataType moType; // of the rasters
};

} // namespace krv::datasources
