#pragma once

#include "datasources/writer/basicwriter.h"
#include "gobs/raster/datatype.h"

#include <cstdint>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::datasources
{

namespace detail
{
struct SampleChanges;
struct WriterGroup;
} // namespace detail

// What a writer of channels of several types has to be told, as far as it does not find it.
// Example: {.moChannels = {eDT_8U, eDT_16U}, .moRaster = eDT_32R} for rasters of 32R into channels of 8 and 16 bits.
struct MixedTypes
{
    // Of the channels of a new file, in the order of the writer's list; none: all are of the type that CreateNewFile
    // is given.
    std::vector<krv::gobs::DataType> moChannels;
    // Of the rasters; nothing: the promoted type of all channels, and for a new file the one of CreateNewFile.
    std::optional<krv::gobs::DataType> moRaster;
    // A raster with samples that their channel's type does not hold is refused before anything of it is written.
    bool mbStrict = false;
};

// A ready-made writer of some channels and their places in the rasters, from 0.
struct ChannelWriter
{
    IRasterWriter* mpoWriter = nullptr; // taken over
    std::vector<unsigned int> moPlaces; // as many as the writer has channels
};

// Writes rasters of one type into channels of several types, and reads them back so: the channels of one type by one
// BasicWriter, every channel at its own place. Values become samples by the rules of krv::raster::CopyData; how many of
// each channel were changed by that, rounded, saturated or cut, is counted. Nothing else differs from BasicWriter.
//
// A failure between the writers of two types leaves one raster half written, as a failure between two rasters does.
// One pass over the samples of a raster splits and converts them.
class KRV_DATASOURCES_API MultiTypeWriter : public BasicWriter
{
public:
    // These are BasicWriter's, whose messages they have; bitmaps are all of one type. moChannels counts for datasets
    // without an image alone. Throws DataException when there are other numbers of types than of channels,
    // ParameterException for a raster type that values cannot be converted from.
    explicit MultiTypeWriter(const std::string& fileName, const MixedTypes& oTypes = {});
    MultiTypeWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                    const MixedTypes& oTypes = {});
    MultiTypeWriter(const std::string& fileName, std::initializer_list<unsigned int> oChannels,
                    const MixedTypes& oTypes = {})
        : MultiTypeWriter(fileName, std::vector<unsigned int>(oChannels), oTypes)
    {
    }
    MultiTypeWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels, const std::string& format,
                    const std::string& options, const MixedTypes& oTypes = {});
    MultiTypeWriter(const std::string& fileName, const IChannelFilter& oFilter, const MixedTypes& oTypes = {});
    MultiTypeWriter(IRasterDataset* poDataset, const std::vector<unsigned int>& oChannels,
                    const MixedTypes& oTypes = {});
    // Writers of one size, such as those of a level, which are taken over, also when this throws; together they place
    // every listed channel once. The dataset, which answers for everything but pixels, stays the caller's. Such a
    // writer makes no levels.
    MultiTypeWriter(IRasterDataset* poDataset, const std::vector<ChannelWriter>& oWriters,
                    const std::vector<unsigned int>& oChannels, const MixedTypes& oTypes = {});
    ~MultiTypeWriter() override;

    // The type of the description is that of the rasters, unless another was asked for, which throws DataException. The
    // channels get the types that were given, each its own.
    using BasicWriter::CreateNewFile;

    // The number of samples so far that are not what the raster had, of each channel in the order of the rasters.
    const std::vector<std::uint64_t>& GetChangedSamples() const;

    // Levels in the type of the rasters, as MultiTypeReader and this class have them. Their writers are not strict:
    // what a level holds is rounded by the method that makes it. BuildOverviews makes the levels of each type by
    // themselves.
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    IOverviewWriterAccessor* GetOverviewWriterAccessor() override;

protected:
    detail::OpenedChannels MakeChannels(IRasterDataset& oDataset, const std::vector<unsigned int>& oChannels,
                                        const krv::Place& oPlace) override;
    void LayOut(IRasterDataset& oDataset, const krv::gobs::RasterInfo& oInfo, const krv::Place& oPlace) override;

private:
    MultiTypeWriter(const MixedTypes& oTypes, std::size_t nChannels, const krv::Place& oPlace);

    krv::gobs::DataType ChooseType(const std::vector<krv::gobs::DataType>& oTypes) const;
    detail::OpenedChannels Join(std::vector<detail::WriterGroup> oGroups, const std::vector<unsigned int>& oChannels,
                                const krv::Place& oPlace);

    MixedTypes moTypes;
    std::shared_ptr<detail::SampleChanges> mpoChanges;
    bool mbReadyMade = false;
};

} // namespace krv::datasources
