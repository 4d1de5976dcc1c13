#include "datasources/writer/multitypewriter.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/multitypeoverviewreaderaccessor.h"
#include "datasources/writer/detail/multitypeio.h"
#include "datasources/writer/multitypeoverviewwriteraccessor.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/rasterinfo.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <map>
#include <utility>

namespace krv::datasources
{

namespace
{

// Types by the numbers of channels, when the list names the first channels of a file, each once: a file is laid out by
// number, not by the order of a list.
std::vector<krv::gobs::DataType> InFileOrder(const std::vector<krv::gobs::DataType>& oTypes,
                                             const std::vector<unsigned int>& oChannels)
{
    std::vector<unsigned int> oSorted = oChannels;
    std::sort(oSorted.begin(), oSorted.end());
    if (oSorted != detail::FirstChannels(static_cast<unsigned int>(oChannels.size())))
        return oTypes;
    std::vector<krv::gobs::DataType> oByNumber(oTypes.size());
    for (std::size_t n = 0; n < oTypes.size(); ++n)
        oByNumber[oChannels[n] - 1] = oTypes[n];
    return oByNumber;
}

class GroupWriter : public BasicWriter
{
public:
    using BasicWriter::BasicWriter;

    // Null before there is an image.
    IRasterIO* GetIO() const { return mpoChannels->GetOpened().mpoRasterIO.get(); }
};

} // namespace

MultiTypeWriter::MultiTypeWriter(const MixedTypes& oTypes, std::size_t nChannels, const Place& oPlace)
    : moTypes(oTypes), mpoChanges(std::make_shared<detail::SampleChanges>())
{
    mpoChanges->mbStrict = oTypes.mbStrict;
    if (oTypes.moRaster)
        static_cast<void>(krv::gobs::QRFDataType2RasterBufferType(*oTypes.moRaster));
    if (!oTypes.moChannels.empty() && nChannels != 0 && oTypes.moChannels.size() != nChannels)
        throw krv::DataException(
            std::to_string(oTypes.moChannels.size()) + " types for " + std::to_string(nChannels) + " channels", oPlace);
}

MultiTypeWriter::MultiTypeWriter(const std::string& fileName, const MixedTypes& oTypes)
    : MultiTypeWriter(oTypes, 0, Place::Current())
{
    UseFile(fileName, Place::Current());
}

MultiTypeWriter::MultiTypeWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                 const MixedTypes& oTypes)
    : MultiTypeWriter(oTypes, oChannels.size(), Place::Current())
{
    UseRasterDataset(RDSIf(fileName), oChannels, true, Place::Current());
}

MultiTypeWriter::MultiTypeWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                 const std::string& format, const std::string& options, const MixedTypes& oTypes)
    : MultiTypeWriter(oTypes, oChannels.size(), Place::Current())
{
    UseFileOrNew(fileName, oChannels, format, options, Place::Current());
}

MultiTypeWriter::MultiTypeWriter(const std::string& fileName, const IChannelFilter& oFilter, const MixedTypes& oTypes)
    : MultiTypeWriter(oTypes, 0, Place::Current())
{
    UseFile(fileName, oFilter, Place::Current());
}

MultiTypeWriter::MultiTypeWriter(IRasterDataset* poDataset, const std::vector<unsigned int>& oChannels,
                                 const MixedTypes& oTypes)
    : MultiTypeWriter(oTypes, oChannels.size(), Place::Current())
{
    UseRasterDataset(poDataset, oChannels, false, Place::Current());
}

MultiTypeWriter::MultiTypeWriter(IRasterDataset* poDataset, const std::vector<ChannelWriter>& oWriters,
                                 const std::vector<unsigned int>& oChannels, const MixedTypes& oTypes)
    : mpoChanges(std::make_shared<detail::SampleChanges>()), mbReadyMade(true)
{
    const Place oPlace = Place::Current();
    std::vector<detail::WriterGroup> oGroups;
    oGroups.reserve(oWriters.size());
    for (const ChannelWriter& oWriter : oWriters)
        oGroups.push_back({std::unique_ptr<IRasterWriter>(oWriter.mpoWriter), {}, nullptr});

    moTypes = oTypes;
    mpoChanges->mbStrict = oTypes.mbStrict;
    if (oChannels.empty())
        throw krv::DataException("Channel list can not be empty", oPlace);
    auto* const poRoot = dynamic_cast<IDataset*>(poDataset);
    if (poRoot == nullptr)
        throw krv::DataException("Invalid Raster Dataset", oPlace);
    std::vector<bool> oPlaced(oChannels.size());
    for (std::size_t n = 0; n < oWriters.size(); ++n)
    {
        const IRasterWriter* const poWriter = oWriters[n].mpoWriter;
        if (poWriter == nullptr)
            throw krv::DataException("A writer is NULL", oPlace);
        if (oWriters[n].moPlaces.size() != poWriter->GetChansCount() || oWriters[n].moPlaces.empty())
            throw krv::DataException("A writer of " + std::to_string(poWriter->GetChansCount()) + " channels has " +
                                         std::to_string(oWriters[n].moPlaces.size()) + " places",
                                     oPlace);
        for (const unsigned int nPlace : oWriters[n].moPlaces)
        {
            if (nPlace >= oPlaced.size() || oPlaced[nPlace])
                throw krv::DataException("The writers do not place every channel once", oPlace);
            oPlaced[nPlace] = true;
        }
        oGroups[n].moPositions = oWriters[n].moPlaces;
    }
    if (std::find(oPlaced.begin(), oPlaced.end(), false) != oPlaced.end())
        throw krv::DataException("The writers do not place every channel once", oPlace);
    Commit(Join(std::move(oGroups), oChannels, oPlace));
    SetDataset(poRoot, oChannels, false);
}

MultiTypeWriter::~MultiTypeWriter() = default;

krv::gobs::DataType MultiTypeWriter::ChooseType(const std::vector<krv::gobs::DataType>& oTypes) const
{
    return moTypes.moRaster ? *moTypes.moRaster : krv::gobs::PromoteType(oTypes);
}

// The groups of one type each as the channels of this writer.
detail::OpenedChannels MultiTypeWriter::Join(std::vector<detail::WriterGroup> oGroups,
                                             const std::vector<unsigned int>& oChannels, const Place& oPlace)
{
    std::vector<krv::gobs::DataType> oTypes(oChannels.size());
    for (const detail::WriterGroup& oGroup : oGroups)
        if (oGroup.mpoWriter->GetWidth() != oGroups.front().mpoWriter->GetWidth() ||
            oGroup.mpoWriter->GetHeight() != oGroups.front().mpoWriter->GetHeight())
            throw krv::DataException("The writers differ in size", oPlace);
    for (const detail::WriterGroup& oGroup : oGroups)
        for (const unsigned int nPosition : oGroup.moPositions)
            oTypes[nPosition] = oGroup.mpoWriter->GetDataType();
    mpoChanges->moCounts.assign(oChannels.size(), 0);
    mpoChanges->moChannels = oChannels;
    const krv::gobs::DataType oType = ChooseType(oTypes);
    detail::OpenedChannels oOpened = detail::OpenRasterIO(
        std::make_unique<detail::MultiTypeIO>(std::move(oGroups), oType, mpoChanges), oType, oPlace);
    for (const krv::gobs::DataType& oOwn : oTypes)
        oOpened.moInfos.Add(std::make_unique<ChannelInfo>(oOwn));
    return oOpened;
}

detail::OpenedChannels MultiTypeWriter::MakeChannels(IRasterDataset& oDataset,
                                                     const std::vector<unsigned int>& oChannels, const Place& oPlace)
{
    struct Members
    {
        std::vector<unsigned int> moChannels;
        std::vector<unsigned int> moPositions;
    };
    std::map<krv::gobs::DataType, Members> oByType;
    detail::ChannelInfos oInfos;
    for (unsigned int nPosition = 0; nPosition < oChannels.size(); ++nPosition)
    {
        std::unique_ptr<IChannelInfo> oInfo(oDataset.GetChannelInfo(oChannels[nPosition]));
        if (oInfo == nullptr)
            throw krv::DataException(
                "The dataset gave no description of channel " + std::to_string(oChannels[nPosition]), oPlace);
        Members& oMembers = oByType[oInfo->GetDataType()];
        oMembers.moChannels.push_back(oChannels[nPosition]);
        oMembers.moPositions.push_back(nPosition);
        oInfos.Add(std::move(oInfo));
    }
    // One type needs no conversion, and no pixel is copied.
    if (oByType.size() == 1 && ChooseType({oByType.begin()->first}) == oByType.begin()->first)
    {
        mpoChanges->moCounts.assign(oChannels.size(), 0);
        return BasicWriter::MakeChannels(oDataset, oChannels, oPlace);
    }
    std::vector<detail::WriterGroup> oGroups;
    for (const auto& [oType, oMembers] : oByType)
    {
        auto poWriter = std::make_unique<GroupWriter>(&oDataset, oMembers.moChannels);
        auto* const poMemory = dynamic_cast<detail::MemoryIO<IRasterIO>*>(poWriter->GetIO());
        oGroups.push_back({std::move(poWriter), oMembers.moPositions, poMemory});
    }
    detail::OpenedChannels oOpened = Join(std::move(oGroups), oChannels, oPlace);
    oOpened.moInfos = std::move(oInfos);
    return oOpened;
}

void MultiTypeWriter::LayOut(IRasterDataset& oDataset, const krv::gobs::RasterInfo& oInfo, const Place& oPlace)
{
    if (moTypes.moRaster && *moTypes.moRaster != oInfo.GetDataType())
        throw krv::DataException("The RasterInfo is of the type " + oInfo.GetDataType().Describe() +
                                     ", the rasters of this writer of " + moTypes.moRaster->Describe(),
                                 oPlace);
    if (moTypes.moChannels.empty())
        return oDataset.Create(oInfo);
    if (moTypes.moChannels.size() != oInfo.GetChansCount())
        throw krv::DataException("The RasterInfo does not match the write channels of this writer", oPlace);
    static_cast<void>(krv::gobs::QRFDataType2RasterBufferType(oInfo.GetDataType()));
    oDataset.Create(oInfo.GetWidth(), oInfo.GetHeight(), InFileOrder(moTypes.moChannels, GetChannels()));
    moTypes.moRaster = oInfo.GetDataType();
}

const std::vector<std::uint64_t>& MultiTypeWriter::GetChangedSamples() const
{
    return mpoChanges->moCounts;
}

IOverviewReaderAccessor* MultiTypeWriter::GetOverviewReaderAccessor()
{
    LazyOpen();
    return new MultiTypeOverviewReaderAccessor(dynamic_cast<IRasterDataset*>(GetDataset()), GetChannels(),
                                               GetDataType());
}

IOverviewWriterAccessor* MultiTypeWriter::GetOverviewWriterAccessor()
{
    LazyOpen();
    if (mbReadyMade || !mpoChannels->HasLevels())
        return nullptr;
    MixedTypes oTypes; // never strict: what a level holds is rounded by the method that makes it
    oTypes.moRaster = GetDataType();
    return new MultiTypeOverviewWriterAccessor(dynamic_cast<IRasterDataset*>(GetDataset()), GetChannels(), oTypes);
}

} // namespace krv::datasources
