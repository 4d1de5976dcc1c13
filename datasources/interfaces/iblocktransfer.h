#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/iencodedblocks.h"

#include <vector>

namespace krv::datasources
{

class IDataset;

// Encoded blocks from file to file, without their way through the program: a facet of datasets that have IEncodedBlocks
// too, found by dynamic_cast. One thread at a time. The order of the virtual operations is public and fixed.
// Blocks that are neither decoded nor encoded are copied at the speed of the disk, without loss whatever the codec.
class KRV_DATASOURCES_API IBlockTransfer
{
public:
    virtual ~IBlockTransfer();

    // Stores blocks of the image (level 1) or of a level as another dataset has them, whose form there is that of here;
    // as few and as large transfers are made as the files allow, for blocks in the order of the source most of all.
    // Blocks that are not stored there stay here what they were. False, and nothing is done, for a dataset of another
    // kind: its blocks go by ReadEncoded and StoreEncoded. Throws what those throw; blocks of the call are then stored
    // all or none.
    virtual bool TakeBlocks(unsigned int nLevel, IDataset& oSource, const std::vector<BlockNumber>& oBlocks) = 0;
};

} // namespace krv::datasources
