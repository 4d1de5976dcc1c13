#include "datasources/reader/multitypereader.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/multitypeoverviewreaderaccessor.h"
#include "datasources/reader/readervalidity.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hblock.h"
#include "toolkit/core/ownedorborrowed.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/raster/merger.h"

#include <algorithm>
#include <exception>
#include <map>
#include <utility>

namespace krv::datasources
{

namespace
{

constexpr const char* NO_RASTER = "This Dataset doesn't supports Raster.";

// Channels of one data type, read together.
struct Group
{
    std::unique_ptr<IRasterReader> mpoReader;
    std::vector<unsigned int> moPositions; // of its channels in the result, from 0
    bool mbConsecutive = true;
};

bool IsConsecutive(const std::vector<unsigned int>& oPositions)
{
    return std::adjacent_find(oPositions.begin(), oPositions.end(),
                              [](unsigned int nFirst, unsigned int nSecond)
                              { return nSecond != nFirst + 1; }) == oPositions.end();
}

// Where the channels of the result come from: a group counts as a source. The later one of two
// groups that are placed on one channel remains.
std::vector<krv::raster::MergeChannel> PlaceChannels(const std::vector<Group>& oGroups, std::size_t nChannels,
                                                     eChannelPlacement ePlacement)
{
    std::vector<krv::raster::MergeChannel> oPlaced(nChannels);
    for (unsigned int nGroup = 0; nGroup < oGroups.size(); ++nGroup)
    {
        const std::vector<unsigned int>& oPositions = oGroups[nGroup].moPositions;
        const bool bSideBySide = !oGroups[nGroup].mbConsecutive && ePlacement == eFromFirstPlace;
        for (unsigned int nChannel = 0; nChannel < oPositions.size(); ++nChannel)
            oPlaced[bSideBySide ? oPositions.front() + nChannel : oPositions[nChannel]] = {nGroup, nChannel};
    }
    return oPlaced;
}

krv::raster::MergeSource AsSource(const Group& oGroup)
{
    return {krv::gobs::QRFDataType2RasterBufferType(oGroup.mpoReader->GetDataType()),
            static_cast<unsigned int>(oGroup.moPositions.size())};
}

// Does something with every group, so that all end in the same state, and when only some can, has the others undo it.
// Returns the first failure.
template <typename Operation, typename Undo>
std::exception_ptr InStep(const std::vector<Group>& oGroups, const Operation& oOperation, const Undo& oUndo)
{
    std::exception_ptr oFailure;
    std::size_t nFailed = 0;
    for (const Group& oGroup : oGroups)
    {
        try
        {
            oOperation(*oGroup.mpoReader);
        }
        catch (...)
        {
            ++nFailed;
            if (oFailure == nullptr)
                oFailure = std::current_exception();
        }
    }
    for (std::size_t nGroup = 0; nGroup < oGroups.size() && nFailed != 0 && nFailed < oGroups.size(); ++nGroup)
        oUndo(*oGroups[nGroup].mpoReader);
    return oFailure;
}

} // namespace

struct MultiTypeReader::State
{
    State() = default;
    State(const State&) = delete;
    State& operator=(const State&) = delete;
    ~State() // before the dataset
    {
        moWords.clear();
        mpoValidity.reset();
        moGroups.clear();
    }

    std::vector<Group> moGroups; // ascending by data type
    OwnedOrBorrowed<IDataset> mpoDataset;
    std::vector<unsigned int> moChannels;
    detail::ChannelInfos moInfos;
    krv::gobs::DataType moType;
    eChannelPlacement mePlacement = eFromFirstPlace;
    bool mbOverviewsDisabled = false;               // the readers were ready-made
    std::unique_ptr<krv::raster::Merger> mpoMerger; // made by the first reading
    std::unique_ptr<ValiditySource> mpoValidity;    // made when it is asked for, as the following
    // What no value of ready-made readers says, by the group.
    std::vector<std::pair<std::size_t, std::unique_ptr<ReaderValidity>>> moWords;
};

MultiTypeReader::MultiTypeReader() : mpoState(std::make_shared<State>()) {}

MultiTypeReader::MultiTypeReader(const MultiTypeReader&) = default;

MultiTypeReader::MultiTypeReader(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                 eChannelPlacement ePlacement)
    : MultiTypeReader()
{
    OpenFile(fileName, oChannels, ePlacement, Place::Current());
    WarnOfLoss(mpoState->moType, Place::Current());
}

MultiTypeReader::MultiTypeReader(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                 const krv::gobs::DataType& oType, eChannelPlacement ePlacement)
    : MultiTypeReader()
{
    OpenFile(fileName, oChannels, ePlacement, Place::Current());
    RequestType(oType, Place::Current());
}

MultiTypeReader::MultiTypeReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                                 eChannelPlacement ePlacement)
    : MultiTypeReader()
{
    UseDataset({poDataset, {}}, oChannels, ePlacement, Place::Current());
    WarnOfLoss(mpoState->moType, Place::Current());
}

MultiTypeReader::MultiTypeReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                                 const krv::gobs::DataType& oType, eChannelPlacement ePlacement)
    : MultiTypeReader()
{
    UseDataset({poDataset, {}}, oChannels, ePlacement, Place::Current());
    RequestType(oType, Place::Current());
}

MultiTypeReader::MultiTypeReader(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                                 const std::vector<unsigned int>& oChannels)
    : MultiTypeReader()
{
    UseReaders(poDataset, oReaders, oChannels, Place::Current());
    WarnOfLoss(mpoState->moType, Place::Current());
}

MultiTypeReader::MultiTypeReader(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                                 const std::vector<unsigned int>& oChannels, const krv::gobs::DataType& oType)
    : MultiTypeReader()
{
    UseReaders(poDataset, oReaders, oChannels, Place::Current());
    RequestType(oType, Place::Current());
}

MultiTypeReader::~MultiTypeReader() = default;

void MultiTypeReader::OpenFile(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                               eChannelPlacement ePlacement, const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException("Channels list is empty", oPlace);
    std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->Open(fileName, eReadOnly));
    detail::RequireFacet<IRasterDataset>(oDataset.get(), "Format does not support rasters: file=" + fileName, oPlace);
    UseDataset({oDataset.release(), {true}}, oChannels, ePlacement, oPlace);
}

void MultiTypeReader::UseDataset(OwnedOrBorrowed<IDataset> oDataset, const std::vector<unsigned int>& oChannels,
                                 eChannelPlacement ePlacement, const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException("Channels list is empty", oPlace);
    IDataset* const poDataset = oDataset.get();
    const auto& oRasters = detail::RequireFacet<IRasterDataset>(poDataset, NO_RASTER, oPlace);
    mpoState->mpoDataset = std::move(oDataset);
    mpoState->moChannels = oChannels;
    mpoState->mePlacement = ePlacement;

    struct Members
    {
        std::vector<unsigned int> moChannels;
        std::vector<unsigned int> moPositions;
    };
    std::map<krv::gobs::DataType, Members> oByType;
    for (unsigned int nPosition = 0; nPosition < oChannels.size(); ++nPosition)
    {
        std::unique_ptr<IChannelInfo> oInfo(oRasters.GetChannelInfo(oChannels[nPosition]));
        if (oInfo == nullptr)
            throw krv::DataException(
                "The dataset gave no description of channel " + std::to_string(oChannels[nPosition]), oPlace);
        Members& oMembers = oByType[oInfo->GetDataType()];
        oMembers.moChannels.push_back(oChannels[nPosition]);
        oMembers.moPositions.push_back(nPosition);
        mpoState->moInfos.Add(std::move(oInfo));
    }
    for (const auto& [oType, oMembers] : oByType)
    {
        mpoState->moGroups.push_back({std::make_unique<BasicReader>(poDataset, oMembers.moChannels, false),
                                      oMembers.moPositions, IsConsecutive(oMembers.moPositions)});
    }
    Settle();
}

void MultiTypeReader::UseReaders(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                                 const std::vector<unsigned int>& oChannels, const Place& oPlace)
{
    std::vector<Group> oGroups;
    oGroups.reserve(oReaders.size());
    for (unsigned int nPosition = 0; nPosition < oReaders.size(); ++nPosition)
        oGroups.push_back({std::unique_ptr<IRasterReader>(oReaders[nPosition]), {nPosition}, true});

    if (oChannels.empty())
        throw krv::DataException("Channels list is empty", oPlace);
    detail::RequireFacet<IRasterDataset>(poDataset, NO_RASTER, oPlace);
    if (oReaders.size() != oChannels.size())
        throw krv::DataException("Number of readers should the same as the number of channels", oPlace);
    for (const Group& oGroup : oGroups)
    {
        const IRasterReader* const poReader = oGroup.mpoReader.get();
        if (poReader == nullptr)
            throw krv::DataException("A reader is NULL", oPlace);
        if (poReader->GetChansCount() != 1)
            throw krv::DataException(
                "A reader has " + std::to_string(poReader->GetChansCount()) + " channels where 1 is expected", oPlace);
        if (poReader->GetWidth() != oReaders.front()->GetWidth() ||
            poReader->GetHeight() != oReaders.front()->GetHeight())
            throw krv::DataException("The readers differ in size", oPlace);
    }
    std::stable_sort(oGroups.begin(), oGroups.end(),
                     [](const Group& oFirst, const Group& oSecond)
                     { return oFirst.mpoReader->GetDataType() < oSecond.mpoReader->GetDataType(); });
    mpoState->mpoDataset.reset(poDataset);
    mpoState->moChannels = oChannels;
    mpoState->moGroups = std::move(oGroups);
    mpoState->mbOverviewsDisabled = true;
    for (IRasterReader* const poReader : oReaders)
        mpoState->moInfos.Add(std::make_unique<ChannelInfo>(poReader->GetDataType()));
    Settle();
}

// The promoted type and one tile grid for the groups; the first of them answers for size, place and format.
void MultiTypeReader::Settle()
{
    std::vector<krv::gobs::DataType> oTypes;
    for (const Group& oGroup : mpoState->moGroups)
        oTypes.push_back(oGroup.mpoReader->GetDataType());
    mpoState->moType = krv::gobs::PromoteType(oTypes);
    SetSource({mpoState->moGroups.front().mpoReader.get(), {}});
    MultiTypeReader::SetOptimalTileSize();
}

void MultiTypeReader::RequestType(const krv::gobs::DataType& oType, const Place& oPlace)
{
    if (oType != mpoState->moType)
        static_cast<void>(krv::gobs::QRFDataType2RasterBufferType(oType)); // refuses what nothing can be converted to
    WarnOfLoss(oType, oPlace);
    mpoState->moType = oType;
}

// Types that order before the promoted one lose something as a rule, and the warning does not look further.
void MultiTypeReader::WarnOfLoss(const krv::gobs::DataType& oType, const Place& oPlace) const
{
    const bool bExact =
        std::all_of(mpoState->moGroups.begin(), mpoState->moGroups.end(),
                    [&](const Group& oGroup) { return krv::gobs::IsLossless(oGroup.mpoReader->GetDataType(), oType); });
    if (!bExact || oType < mpoState->moType)
        krv::nspio::Warning::Warn("Lost of information possible due to data type promotion provided by this reader.",
                                  oPlace);
}

void MultiTypeReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    if (poRaster == nullptr)
        throw krv::DataException("The raster is NULL");
    if (poRaster->GetChansCount() != GetChansCount())
        throw krv::DataException("The number of channels in the requested Rasterdoesn't match the number of channel of "
                                 "this Reader.");
    if (poRaster->GetDataType() != mpoState->moType)
        throw krv::DataException("The data type in the requested Rasterdoesn't match the data type of this Reader.");
    if (mpoState->moGroups.size() == 1 && GetSource().GetDataType() == poRaster->GetDataType())
        GetSource().ReadRaster(poRaster);
    else
        ReadGroups(*poRaster);
}

// Every group is read into one scratch block; then the result is made from all of them in one pass.
void MultiTypeReader::ReadGroups(krv::gobs::Raster& oRaster)
{
    std::vector<std::uint64_t> oOffsets;
    std::uint64_t nScratchBytes = 0;
    for (const Group& oGroup : mpoState->moGroups)
    {
        oOffsets.push_back(nScratchBytes);
        nScratchBytes += krv::gobs::BufferBytes(oRaster.GetFullWidth(), oRaster.GetFullHeight(),
                                                oGroup.moPositions.size(), oGroup.mpoReader->GetDataType());
        nScratchBytes = (nScratchBytes + 63) / 64 * 64;
    }
    const HBlock oScratch(static_cast<unsigned char*>(HMalloc(nScratchBytes)));

    std::vector<const unsigned char*> oSources;
    for (std::size_t nGroup = 0; nGroup < mpoState->moGroups.size(); ++nGroup)
    {
        const Group& oGroup = mpoState->moGroups[nGroup];
        unsigned char* const pPart = oScratch.get() + oOffsets[nGroup];
        const krv::gobs::RasterInfo oInfo(oRaster.GetWidth(), oRaster.GetHeight(),
                                          static_cast<unsigned int>(oGroup.moPositions.size()),
                                          oGroup.mpoReader->GetDataType());
        krv::gobs::Raster oPart(oInfo, oRaster.GetContext(), pPart, false);
        oGroup.mpoReader->ReadRaster(&oPart);
        oSources.push_back(pPart);
    }
    GetMerger().Run(oSources, oRaster.GetBuffer(), oRaster.GetFullWidth() * oRaster.GetFullHeight());
}

krv::raster::Merger& MultiTypeReader::GetMerger()
{
    if (mpoState->mpoMerger == nullptr)
    {
        std::vector<krv::raster::MergeSource> oSources;
        for (const Group& oGroup : mpoState->moGroups)
            oSources.push_back(AsSource(oGroup));
        mpoState->mpoMerger = std::make_unique<krv::raster::Merger>(
            oSources, krv::gobs::QRFDataType2RasterBufferType(mpoState->moType),
            PlaceChannels(mpoState->moGroups, mpoState->moChannels.size(), mpoState->mePlacement));
    }
    return *mpoState->mpoMerger;
}

void MultiTypeReader::SetOptimalTileSize()
{
    GetSource().SetOptimalTileSize();
    SetTileSize(GetSource().GetTileWidth(), GetSource().GetTileHeight());
}

void MultiTypeReader::SetTileSize(unsigned int nWidth, unsigned int nHeight)
{
    const unsigned int nOldWidth = GetTileWidth();
    const unsigned int nOldHeight = GetTileHeight();
    DerivedReader::SetTileSize(nWidth, nHeight); // a size that the grid refuses changes no group
    const auto oSet = [=](IRasterReader& oReader)
    {
        oReader.SetTileSize(nWidth, nHeight);
    };
    const auto oUndo = [=](IRasterReader& oReader)
    {
        oReader.SetTileSize(nOldWidth, nOldHeight);
    };
    const std::exception_ptr oFailure = InStep(mpoState->moGroups, oSet, oUndo);
    if (oFailure == nullptr)
        return;
    DerivedReader::SetTileSize(nOldWidth, nOldHeight);
    std::rethrow_exception(oFailure);
}

void MultiTypeReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    const auto oSet = [=](IRasterReader& oReader)
    {
        oReader.SetMargins(nXMargin, nYMargin, eBehaviour);
    };
    const auto oUndo = [this](IRasterReader& oReader)
    {
        oReader.SetMargins(GetXMargin(), GetYMargin(), GetMarginBehaviour());
    };
    const std::exception_ptr oFailure = InStep(mpoState->moGroups, oSet, oUndo);
    KeepMargins(GetSource().GetXMargin(), GetSource().GetYMargin(), GetSource().GetMarginBehaviour());
    if (oFailure != nullptr)
        std::rethrow_exception(oFailure);
}

IOverviewReaderAccessor* MultiTypeReader::GetOverviewReaderAccessor()
{
    if (mpoState->mbOverviewsDisabled)
        return nullptr;
    return new MultiTypeOverviewReaderAccessor(dynamic_cast<IRasterDataset*>(mpoState->mpoDataset.get()),
                                               mpoState->moChannels, mpoState->moType);
}

AuxiliaryData MultiTypeReader::GetAuxiliaryData() const
{
    if (!mpoState->mbOverviewsDisabled)
        return detail::SelectChannelData(*mpoState->mpoDataset, mpoState->moChannels);
    AuxiliaryData oData(GetChansCount());
    oData.SetFileMetadata(mpoState->mpoDataset->ReadAuxiliaryData().GetFileMetadata());
    for (const Group& oGroup : mpoState->moGroups)
    {
        const AuxiliaryData oOwn = oGroup.mpoReader->GetAuxiliaryData();
        const unsigned int nChannel = oGroup.moPositions.front() + 1;
        oData.SetChanMetadata(oOwn.GetChanMetadata(1), nChannel);
        oData.SetChannelDescription(oOwn.GetChannelDescription(1), nChannel);
    }
    return oData;
}

const std::vector<IChannelInfo*>& MultiTypeReader::GetChannelsInfo() const
{
    return mpoState->moInfos.Get();
}

unsigned int MultiTypeReader::GetChansCount() const
{
    return static_cast<unsigned int>(mpoState->moChannels.size());
}

const krv::gobs::DataType& MultiTypeReader::GetDataType() const
{
    return mpoState->moType;
}

IDataset* MultiTypeReader::GetDataset() const
{
    return mpoState->mpoDataset.get();
}

const std::vector<unsigned int>& MultiTypeReader::GetChannels() const
{
    return mpoState->moChannels;
}

void MultiTypeReader::FindValidity()
{
    if (mpoState->mpoValidity != nullptr)
        return;
    IDataset* const poDataset = mpoState->mpoDataset.get();
    const std::vector<Group>& oGroups = mpoState->moGroups;
    const bool bOfDataset = std::all_of(oGroups.begin(), oGroups.end(),
                                        [&](const Group& oGroup)
                                        {
                                            const auto* const po =
                                                dynamic_cast<const RasterAccess*>(oGroup.mpoReader.get());
                                            return po != nullptr && po->GetDataset() == poDataset;
                                        });
    if (bOfDataset)
    {
        mpoState->mpoValidity =
            std::make_unique<ValiditySource>(poDataset, mpoState->moChannels, GetWidth(), GetHeight());
        return;
    }
    auto poValidity = std::make_unique<ValiditySource>(static_cast<const IRasterReader&>(*this));
    for (std::size_t nGroup = 0; nGroup < oGroups.size(); ++nGroup)
    {
        auto poWord = std::make_unique<ReaderValidity>(*oGroups[nGroup].mpoReader);
        if (poWord->IsNeeded() && !poWord->IsByValues())
            mpoState->moWords.emplace_back(nGroup, std::move(poWord));
    }
    mpoState->mpoValidity = std::move(poValidity);
}

bool MultiTypeReader::HasValidity()
{
    FindValidity();
    const ValiditySource& oValidity = *mpoState->mpoValidity;
    return oValidity.HasNoData() || oValidity.HasBitmap() || oValidity.HasAlpha() || !mpoState->moWords.empty();
}

std::unique_ptr<krv::gobs::Mask> MultiTypeReader::ReadValid(krv::gobs::Raster& oRaster)
{
    ReadRaster(&oRaster);
    if (!HasValidity())
        return nullptr;
    mpoState->mpoValidity->SetMarginBehaviour(GetMarginBehaviour());
    std::unique_ptr<krv::gobs::Mask> poMask(mpoState->mpoValidity->BuildMask(oRaster));
    for (const auto& [nGroup, poWord] : mpoState->moWords)
    {
        const Group& oGroup = mpoState->moGroups[nGroup];
        krv::gobs::Raster oPart({oRaster.GetWidth(), oRaster.GetHeight(),
                                 static_cast<unsigned int>(oGroup.moPositions.size()), oGroup.mpoReader->GetDataType()},
                                oRaster.GetContext());
        if (const auto poOther = poWord->Read(oPart))
            poMask->KeepCommon(*poOther);
    }
    return poMask;
}

} // namespace krv::datasources
