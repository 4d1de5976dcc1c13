#pragma once

#include "datasources/writer/basicoverviewwriteraccessor.h"
#include "datasources/writer/multitypewriter.h"

#include <vector>

namespace krv::datasources
{

// Levels of channels of several types, each written as one image of a type. Everything but the writer of a level is as
// BasicOverviewWriterAccessor has it; its messages are too.
// MultiTypeWriter::GetOverviewWriterAccessor gives one.
class KRV_DATASOURCES_API MultiTypeOverviewWriterAccessor : public BasicOverviewWriterAccessor
{
public:
    // oTypes: the type of the rasters, and whether samples may change.
    // poRasterDataset: borrowed; outlives the accessor and its writers.
    MultiTypeOverviewWriterAccessor(IRasterDataset* poRasterDataset, const std::vector<unsigned int>& oChannels,
                                    const MixedTypes& oTypes = {});
    ~MultiTypeOverviewWriterAccessor() override;

    // Ascending, each once, however the channels of several types are kept.
    std::vector<unsigned int> GetLevels() const override;
    // A MultiTypeWriter over a BasicWriter for each type.
    IRasterWriter* CreateRasterWriter(unsigned int nLevel) override;

private:
    MixedTypes moTypes;
};

} // namespace krv::datasources
