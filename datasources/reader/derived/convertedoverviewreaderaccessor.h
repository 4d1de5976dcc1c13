#pragma once

#include "datasources/reader/derived/derivedoverviewreaderaccessor.h"

namespace krv::datasources
{

// What a reader of other channels than its source's says of their levels.
// For readers whose channels are made of several, such as colours or power.
struct ConvertedLevels
{
    LevelWrapper moWrap;         // of the source's level into this kind of reader
    unsigned int mnChannels = 0; // of the result; each of them is made of all channels of the source
    // Whether a level of the source serves, by the record of the source; what does not serve is not offered.
    std::function<bool(unsigned int nLevel)> moServes;
    // The record of a level, with its channels, from that of the source's.
    std::function<AuxiliaryData(const AuxiliaryData& oRecord)> moConvert;
};

// The levels of another accessor as levels of other channels: those that serve, and that it has for all of its
// channels.
// Channel numbers here are those of the result.
class KRV_DATASOURCES_API ConvertedOverviewReaderAccessor : public DerivedOverviewReaderAccessor
{
public:
    // poLevels: of the source, not null; taken over.
    ConvertedOverviewReaderAccessor(std::unique_ptr<IOverviewReaderAccessor> poLevels, ConvertedLevels oRules);
    ~ConvertedOverviewReaderAccessor() override;

    std::vector<unsigned int> GetLevels() const override;
    // Throws OutOfBoundsException for a channel that is not there.
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override;
    bool IsLevelValid(unsigned int nLevel) const override;
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override;
    unsigned int GetChanCount() const override { return moRules.mnChannels; }
    // Throws DataException for a level that is not offered.
    IRasterReader* CreateRasterReader(unsigned int nLevel) override;

private:
    ConvertedLevels moRules;
};

} // namespace krv::datasources
