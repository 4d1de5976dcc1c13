#pragma once

#include "datasources/reader/ioverviewaccessor.h"

#include <memory>
#include <vector>

namespace krv::datasources
{

class IOverviewManager;
class IRasterDataset;

// The levels of a dataset's own overview facet or, when that has none, of a second opening of the same file through the
// generic format, which finds levels beside the file. The choice is made once. Copies share what they hold.
// The dataset outlives the accessor, and the accessor every reader that it makes.
// BasicReader::GetOverviewReaderAccessor gives one. One thread at a time, that of the dataset.
class KRV_DATASOURCES_API BasicOverviewReaderAccessor : public IOverviewReaderAccessor
{
public:
    // oReadChannels: channels of the file, from 1. Throws DataException for a null dataset and an empty list.
    BasicOverviewReaderAccessor(IRasterDataset* poRasterDataset, const std::vector<unsigned int>& oReadChannels);
    BasicOverviewReaderAccessor(const BasicOverviewReaderAccessor& oOther);
    BasicOverviewReaderAccessor& operator=(const BasicOverviewReaderAccessor& oOther);
    ~BasicOverviewReaderAccessor() override;

    // Without any overview facet: no levels, nothing valid, empty metadata.
    std::vector<unsigned int> GetLevels() const override;
    // Throws OutOfBoundsException for a position outside the list.
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override;

    // Looks at all channels of the list.
    bool IsLevelValid(unsigned int nLevel) const override;
    // Descriptions are not copied.
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override;
    unsigned int GetChanCount() const override;
    // Throws DataException when there is no overview facet.
    IRasterReader* CreateRasterReader(unsigned int nLevel) override;
    // The same over other channels of the file than those of the list.
    IRasterReader* CreateRasterReader(unsigned int nLevel, const std::vector<unsigned int>& oChannels);

private:
    struct Source;

    std::shared_ptr<Source> mpoSource;
    std::vector<unsigned int> moReadChannels;
};

} // namespace krv::datasources
