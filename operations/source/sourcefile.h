#pragma once

#include "datasources/interfaces/accessmode.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "gobs/raster/datatype.h"
#include "operations/api.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::datasources
{
class BasicReader;
class IDataset;
class IOverviewReaderAccessor;
class IRasterDataset;
class IRasterReader;
class ValiditySource;
} // namespace krv::datasources

namespace krv::operations
{

// Why a file cannot be opened, from the operating system: "there is no such file", "it is a folder", ... ; empty when
// nothing stands against it.
KRV_OPERATIONS_API std::string WhyUnreadable(const std::string& file);

// A channel's no-data value, when it has one.
using OptionalNoData = std::optional<krv::datasources::NoDataValue>;

// What a channel's values stand for: value * scale + offset.
// Example: elevations in centimetres have a scale of 0.01 and an offset of 0.
struct ValueScale
{
    double scale = 1;
    double offset = 0;

    double operator()(double nValue) const { return nValue * scale + offset; }
    bool IsIdentity() const { return scale == 1 && offset == 0; }
};

// A reader and, for a level, what it stands on.
// Owns all that it holds. Moves; the moved-from one is empty.
class KRV_OPERATIONS_API LevelReader
{
public:
    LevelReader(std::unique_ptr<krv::datasources::IRasterReader> poFull,
                std::unique_ptr<krv::datasources::IOverviewReaderAccessor> poAccessor,
                std::unique_ptr<krv::datasources::IRasterReader> poLevel);
    LevelReader(LevelReader&&) noexcept;
    ~LevelReader();

    // The level where there is one, else the image. It lives as long as this.
    krv::datasources::IRasterReader& Get() const { return mpoLevel != nullptr ? *mpoLevel : *mpoFull; }

    // The coarsest level of the reader that is not smaller than the wanted size, else the reader itself. A level that
    // cannot be read is a warning, which names the file.
    static LevelReader AtLeast(std::unique_ptr<krv::datasources::IRasterReader> poFull, unsigned int nWidth,
                               unsigned int nHeight, const std::string& name);

private:
    // In this order, so that the level's reader goes first.
    std::unique_ptr<krv::datasources::IRasterReader> mpoFull;
    std::unique_ptr<krv::datasources::IOverviewReaderAccessor> mpoAccessor;
    std::unique_ptr<krv::datasources::IRasterReader> mpoLevel;
};

// Channels of one type, which one reader serves, and where each stands in the list that was grouped.
struct ChannelGroup
{
    std::vector<unsigned int> channels; // numbers in the file, from 1
    std::vector<std::size_t> positions; // in the list that was grouped, from 0
};

// An open file. Readers live at most as long as it.
class KRV_OPERATIONS_API SourceFile
{
public:
    // noData: taken for the no-data value of all channels, in place of what the file records. Passes what the manager
    // throws, and throws RequestException for a text that is no number.
    explicit SourceFile(const std::string& name, AccessMode eMode = eReadOnly,
                        const std::optional<std::string>& noData = {});
    ~SourceFile();

    // The same file opened once more for reading, for a thread of its own; null when that cannot be: it is another by
    // now, or nobody else can open it. bUpdated: this process updates it meanwhile, which changes nothing of what is
    // read; so it is of a file opened for updating, of which this shows the state on the disk. Any thread.
    std::unique_ptr<SourceFile> OpenAgain(bool bUpdated = false) const;
    // A reader over the file opened again, which goes with it; null when that cannot be. Any thread.
    std::shared_ptr<krv::datasources::IRasterReader> ReadAgain(const std::vector<unsigned int>& oChannels,
                                                               bool bUpdated = false) const;

    // As it was given.
    const std::string& GetName() const { return moName; }

    // For what this class has no word for. It goes with this object.
    krv::datasources::IDataset& GetDataset() const { return *mpoDataset; }
    // Null when the file holds no image.
    krv::datasources::IRasterDataset* FindRaster() const { return mpoRaster; }
    // Throws DataException when the file holds no image.
    krv::datasources::IRasterDataset& GetRaster() const;

    // Throws DataException when the file holds no image, as the next one does; channels count from 1.
    unsigned int GetChannelCount() const;
    krv::gobs::DataType GetType(unsigned int nChannel) const;

    // Read when the file was opened.
    const krv::datasources::AuxiliaryData& GetMetadata() const { return moMetadata; }
    // Whether a geocoding that is the identity is a place: only beside a reference system, and where neither ground
    // control points nor a rotated "map info" say another.
    bool IsIdentityPlace(bool bHasCrs) const;
    // The channel's value of "NO_DATA_VALUE", else the file's, without white space around it; empty when there is none.
    std::string GetNoDataText(unsigned int nChannel) const;
    // The number in that text; a text that is none counts as no value, and a warning says so.
    OptionalNoData GetNoData(unsigned int nChannel) const;

    // By the channel's tags "Scale" and "Offset"; the identity where they are no numbers.
    ValueScale GetScale(unsigned int nChannel) const;

    // Which pixels of rasters of these channels are valid, by mask, alpha and, with bNoData, the no-data values: a
    // pixel without data in all that have one.
    std::unique_ptr<krv::datasources::ValiditySource> MakeValidity(const std::vector<unsigned int>& oChannels,
                                                                   bool bNoData = true) const;

    // All channels for an empty list. Throws RequestException for a channel that the file does not have.
    std::vector<unsigned int> CheckChannels(const std::vector<unsigned int>& oChannels) const;
    // By type, in the order in which the types appear.
    std::vector<ChannelGroup> GroupByType(const std::vector<unsigned int>& oChannels) const;

    // Channels of one type at full size (level 1) or at a level. Throws RequestException for a level that is not there.
    LevelReader Read(const std::vector<unsigned int>& oChannels, unsigned int nLevel = 1) const;
    // The coarsest level that is not smaller than the wanted size (LevelReader::AtLeast).
    LevelReader ReadAtLeast(const std::vector<unsigned int>& oChannels, unsigned int nWidth,
                            unsigned int nHeight) const;

private:
    // What tells one file of a name from another.
    struct Identity
    {
        explicit Identity(const std::string& name);
        bool operator==(const Identity&) const = default;

        std::uint64_t mnDevice = 0;
        std::uint64_t mnNode = 0;   // 0: it is no file that others can open
        std::int64_t mnSize = 0;    // bytes
        std::int64_t mnSeconds = 0; // of the last change
        std::int64_t mnNanoseconds = 0;
    };

    // A format plug-in's answers need not agree.
    std::unique_ptr<krv::datasources::BasicReader> ReadFull(const std::vector<unsigned int>& oChannels) const;

    std::string moName;
    AccessMode meMode; // as it was opened
    std::optional<std::string> moNoData;
    Identity moIdentity; // as it was just before it was opened
    std::unique_ptr<krv::datasources::IDataset> mpoDataset;
    krv::datasources::IRasterDataset* mpoRaster; // a facet of the dataset
    krv::datasources::AuxiliaryData moMetadata;  // of the file, read once
};

} // namespace krv::operations
