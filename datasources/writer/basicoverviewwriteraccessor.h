#pragma once

#include "datasources/writer/ioverviewwriteraccessor.h"
#include "toolkit/exceptions/place.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{

class IOverviewManager;
class IRasterDataset;

// Levels through the dataset's own overview facet. Copies share it. The dataset outlives the accessor, and the accessor
// every writer that it makes.
// BasicWriter::GetOverviewWriterAccessor gives one; BuildOverviews does all of the work with it.
class KRV_DATASOURCES_API BasicOverviewWriterAccessor : public IOverviewWriterAccessor
{
public:
    // oChannels: channels of the file, from 1. Throws DataException for a null dataset and an empty list.
    BasicOverviewWriterAccessor(IRasterDataset* poRasterDataset, const std::vector<unsigned int>& oChannels);
    BasicOverviewWriterAccessor(const BasicOverviewWriterAccessor& oOther);
    BasicOverviewWriterAccessor& operator=(const BasicOverviewWriterAccessor& oOther);
    ~BasicOverviewWriterAccessor() override;

    // Every operation but GetChanCount throws DataException for a dataset without an overview facet; positions outside
    // the list throw OutOfBoundsException.
    std::vector<unsigned int> GetLevels() const override;
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override;
    bool IsLevelValid(unsigned int nLevel) const override;
    // Descriptions are not copied.
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override;
    unsigned int GetChanCount() const override;

    // A new writer, owned by the caller.
    IRasterWriter* CreateRasterWriter(unsigned int nLevel) override;
    void CreateLevel(unsigned int nLevel) override;
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override;
    void SetLevelValid(unsigned int nLevel, bool bValid) override;
    void SetResamplingName(const std::string& oName) override;

protected:
    // Throws DataException for a dataset without an overview facet.
    IOverviewManager& Manager(const krv::Place& oPlace) const;
    IRasterDataset& GetRasterDataset() const { return *mpoRasterDataset; }
    const std::vector<unsigned int>& GetChannels() const { return moChannels; }

private:
    std::shared_ptr<IOverviewManager> mpoManager;
    IRasterDataset* mpoRasterDataset;     // borrowed
    std::vector<unsigned int> moChannels; // of the file, from 1
};

} // namespace krv::datasources
