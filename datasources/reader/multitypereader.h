#pragma once

#include "datasources/reader/derived/derivedreader.h"
#include "gobs/raster/datatype.h"
#include "toolkit/core/ownedorborrowed.h"
#include "toolkit/exceptions/place.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::raster
{
class Merger;
}

namespace krv::datasources
{

class BasicOverviewReaderAccessor;
class IChannelInfo;
class IDataset;
class IRasterDataset;

// Where the channels of one data type go when their places in the channel list have gaps.
enum eChannelPlacement
{
    // Side by side from the first of their places, intended: stored processing chains count on it. Channels of the
    // result that nothing is placed on are 0. Levels have every channel at its own place, so of channels of 8U, 16U and
    // 8U the image and its levels show different ones in place 3: who shows one for the other asks for eOwnPlace.
    eFromFirstPlace = 0,
    // Every channel at its own place.
    eOwnPlace = 1
};

// Serves channels of different data types as one image of a single type: the promoted type of all channels or a
// requested one. Channels of one type are read together; all groups are converted and placed in the result in one pass.
// A constructor warns when the type does not hold the values of every channel exactly, and when a requested type orders
// before the promoted one. Readers of the groups stay in step: a setting that some of them refuse changes none.
// Example: 8U, 16U and 32R as one image of 32R: MultiTypeReader oReader("mixed.tif", {1, 2, 3}, eOwnPlace);
class KRV_DATASOURCES_API MultiTypeReader : public DerivedReader
{
public:
    // Channels of a file, from 1. An empty list is a DataException here, intended: a mixed file has no natural list.
    MultiTypeReader(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                    eChannelPlacement ePlacement = eFromFirstPlace);
    // The same in a requested type. Throws ParameterException for a type that values cannot be converted to.
    MultiTypeReader(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                    const krv::gobs::DataType& oType, eChannelPlacement ePlacement = eFromFirstPlace);
    // Channels of a dataset that stays the caller's and outlives the reader.
    MultiTypeReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                    eChannelPlacement ePlacement = eFromFirstPlace);

    // The type of all pixels; values that it does not hold are rounded and saturated.
    MultiTypeReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels, const krv::gobs::DataType& oType,
                    eChannelPlacement ePlacement = eFromFirstPlace);
    // Ready-made readers of one channel each and of one size, reader n for channel n of the result; they are taken
    // over, also when the constructor throws. They answer for the metadata of their channels, the first of them, in the
    // order of types, for format, reference system and geocoding, and the dataset for the metadata of the file. The
    // channel numbers are only kept. There are no overviews.
    MultiTypeReader(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                    const std::vector<unsigned int>& oChannels);
    MultiTypeReader(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                    const std::vector<unsigned int>& oChannels, const krv::gobs::DataType& oType);
    // A copy shares readers, settings and dataset with the original; the last of them releases what is owned.
    MultiTypeReader(const MultiTypeReader& oOther);
    MultiTypeReader& operator=(const MultiTypeReader&) = delete;
    ~MultiTypeReader() override;

    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override;
    // The block of the first group's format, for all groups.
    void SetOptimalTileSize() override;

    // Of all groups at once.
    void SetTileSize(unsigned int nWidth, unsigned int nHeight) override;
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override;
    AuxiliaryData GetAuxiliaryData() const override;
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    unsigned int GetChansCount() const override;

    // The requested type, else the promoted one.
    const krv::gobs::DataType& GetDataType() const override;

    IDataset* GetDataset() const override;

    // Of the dataset, in the order of the result.
    const std::vector<unsigned int>& GetChannels() const override;

    // What the dataset says of the channels. Of ready-made readers that stand on something else: their no-data values,
    // in all channels that have one, and what else each of them knows.
    bool HasValidity() override;
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

protected:
    // For derived readers, which set up their own state by what the public constructors call, and before anything else
    // is: channels of a dataset, which goes with the reader when it is owned, or ready-made readers; then the type.
    MultiTypeReader();

    void UseDataset(OwnedOrBorrowed<IDataset> oDataset, const std::vector<unsigned int>& oChannels,
                    eChannelPlacement ePlacement, const krv::Place& oPlace = krv::Place::Current());
    void UseReaders(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                    const std::vector<unsigned int>& oChannels, const krv::Place& oPlace = krv::Place::Current());
    void RequestType(const krv::gobs::DataType& oType, const krv::Place& oPlace = krv::Place::Current());

private:
    struct State;

    void OpenFile(const std::string& fileName, const std::vector<unsigned int>& oChannels, eChannelPlacement ePlacement,
                  const krv::Place& oPlace);
    void Settle();
    void FindValidity();
    void WarnOfLoss(const krv::gobs::DataType& oType, const krv::Place& oPlace) const;
    void ReadGroups(krv::gobs::Raster& oRaster);
    krv::raster::Merger& GetMerger();

    std::shared_ptr<State> mpoState;
};

} // namespace krv::datasources
