#include "datasources/reader/multitypereader.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/multitypeoverviewreaderaccessor.h"
#include "datasources/reader/rasteriterator.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hmalloc.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <cstring>
#include <exception>
#include <map>
#include <numeric>
#include <utility>

namespace krv::datasources
{

namespace
{

// Pixels that are converted for all groups before the next ones: their part of the result stays in the cache.
constexpr std::uint64_t BLOCK_PIXELS = 512;

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

struct FreeScratch
{
    void operator()(unsigned char* pBlock) const { HFree(pBlock); }
};
using Scratch = std::unique_ptr<unsigned char, FreeScratch>;

// One run of adjacent channels that goes from a group's buffer into the result.
struct Run
{
    const unsigned char* mpSource;
    krv::raster::BufferType meSource;
    std::uint64_t mnSourceStride;
    std::uint64_t mnSourcePixelBytes;
    unsigned int mnTarget; // channel of the result
    unsigned int mnChannels;
};

// Runs of positions without gaps; under eFromFirstPlace the whole group is one run.
void AddRuns(const Group& oGroup, const unsigned char* pSource, eChannelPlacement ePlacement, std::vector<Run>& oRuns)
{
    const krv::gobs::DataType& oType = oGroup.mpoReader->GetDataType();
    const auto eSource = krv::gobs::QRFDataType2RasterBufferType(oType);
    const auto nCount = static_cast<unsigned int>(oGroup.moPositions.size());
    const std::uint64_t nValueBytes = oType.GetValueBits() / 8;
    const bool bWhole = oGroup.mbConsecutive || ePlacement == eFromFirstPlace;
    for (unsigned int nFirst = 0; nFirst < nCount;)
    {
        unsigned int nNext = bWhole ? nCount : nFirst + 1;
        while (nNext < nCount && oGroup.moPositions[nNext] == oGroup.moPositions[nNext - 1] + 1)
            ++nNext;
        oRuns.push_back({pSource + nFirst * nValueBytes, eSource, nCount, nCount * nValueBytes,
                         oGroup.moPositions[nFirst], nNext - nFirst});
        nFirst = nNext;
    }
}

} // namespace

struct MultiTypeReader::State
{
    State() = default;
    State(const State&) = delete;
    State& operator=(const State&) = delete;
    ~State()
    {
        moGroups.clear();
        if (mbOwnsDataset)
            delete mpoDataset;
    }

    IRasterReader& First() const { return *moGroups.front().mpoReader; }

    std::vector<Group> moGroups;    // ascending by data type
    IDataset* mpoDataset = nullptr; // deleted only when mbOwnsDataset
    std::vector<unsigned int> moChannels;
    detail::ChannelInfos moInfos;
    krv::gobs::DataType moType;
    krv::gobs::TileIterator moTiles{0, 0};
    eChannelPlacement mePlacement = eFromFirstPlace;
    bool mbOwnsDataset = false;
    bool mbOverviewsDisabled = false;
};

MultiTypeReader::MultiTypeReader() : mpoState(std::make_unique<State>()) {}

MultiTypeReader::MultiTypeReader(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                 eChannelPlacement ePlacement)
    : MultiTypeReader()
{
    OpenFile(fileName, oChannels, ePlacement, Place::Current());
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
    UseDataset(poDataset, oChannels, ePlacement, Place::Current());
}

MultiTypeReader::MultiTypeReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                                 const krv::gobs::DataType& oType, eChannelPlacement ePlacement)
    : MultiTypeReader()
{
    UseDataset(poDataset, oChannels, ePlacement, Place::Current());
    RequestType(oType, Place::Current());
}

MultiTypeReader::MultiTypeReader(IDataset* poDataset, const std::vector<IRasterReader*>& oReaders,
                                 const std::vector<unsigned int>& oChannels)
    : MultiTypeReader()
{
    UseReaders(poDataset, oReaders, oChannels, Place::Current());
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
    if (dynamic_cast<IRasterDataset*>(oDataset.get()) == nullptr)
        throw krv::DataException("Format does not support rasters: file=" + fileName, oPlace);
    mpoState->mbOwnsDataset = true;
    mpoState->mpoDataset = oDataset.release();
    UseDataset(mpoState->mpoDataset, oChannels, ePlacement, oPlace);
}

void MultiTypeReader::UseDataset(IDataset* poDataset, const std::vector<unsigned int>& oChannels,
                                 eChannelPlacement ePlacement, const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException("Channels list is empty", oPlace);
    auto* const poRasterDataset = dynamic_cast<IRasterDataset*>(poDataset);
    if (poRasterDataset == nullptr)
        throw krv::DataException("This Dataset doesn't supports Raster.", oPlace);
    mpoState->mpoDataset = poDataset;
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
        std::unique_ptr<IChannelInfo> oInfo(poRasterDataset->GetChannelInfo(oChannels[nPosition]));
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
    for (unsigned int nPosition = 0; nPosition < oReaders.size(); ++nPosition)
        oGroups.push_back({std::unique_ptr<IRasterReader>(oReaders[nPosition]), {nPosition}, true});

    if (oChannels.empty())
        throw krv::DataException("Channels list is empty", oPlace);
    auto* const poRasterDataset = dynamic_cast<IRasterDataset*>(poDataset);
    if (poRasterDataset == nullptr)
        throw krv::DataException("This Dataset doesn't supports Raster.", oPlace);
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
    mpoState->mpoDataset = poDataset;
    mpoState->moChannels = oChannels;
    mpoState->moGroups = std::move(oGroups);
    mpoState->mbOverviewsDisabled = true;
    for (IRasterReader* const poReader : oReaders)
        mpoState->moInfos.Add(std::make_unique<ChannelInfo>(poReader->GetDataType()));
    Settle();
}

// The promoted type and one tile grid for the groups.
void MultiTypeReader::Settle()
{
    std::vector<krv::gobs::DataType> oTypes;
    for (const Group& oGroup : mpoState->moGroups)
        oTypes.push_back(oGroup.mpoReader->GetDataType());
    mpoState->moType = krv::gobs::PromoteType(oTypes);
    mpoState->moTiles = krv::gobs::TileIterator(GetWidth(), GetHeight());
    MultiTypeReader::SetOptimalTileSize();
}

void MultiTypeReader::RequestType(const krv::gobs::DataType& oType, const Place& oPlace)
{
    if (oType == mpoState->moType)
        return;
    static_cast<void>(krv::gobs::QRFDataType2RasterBufferType(oType)); // refuses what nothing can be converted to
    if (oType < mpoState->moType)
        krv::nspio::Warning::Warn("Lost of information possible due to data type promotion provided by this reader.",
                                  oPlace.GetSourceFile(), oPlace.GetLine());
    mpoState->moType = oType;
}

krv::gobs::Raster* MultiTypeReader::GetRaster(unsigned int nIndex)
{
    const krv::gobs::Tile oTile = mpoState->moTiles.GetTile(nIndex);
    return ReadRaster(oTile.GetX(), oTile.GetY(), oTile.GetWidth(), oTile.GetHeight());
}

krv::gobs::Raster* MultiTypeReader::ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth,
                                               unsigned int nHeight)
{
    const Place oPlace = Place::Current();
    const krv::gobs::RasterInfo oInfo(nWidth, nHeight, GetChansCount(), mpoState->moType);
    const krv::gobs::RasterContext oContext(detail::ToPosition(nX, oPlace), detail::ToPosition(nY, oPlace),
                                            GetXMargin(), GetYMargin());
    auto oRaster = std::make_unique<krv::gobs::Raster>(oInfo, oContext);
    ReadRaster(oRaster.get());
    return oRaster.release();
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
    if (mpoState->moGroups.size() == 1 && mpoState->First().GetDataType() == poRaster->GetDataType())
        mpoState->First().ReadRaster(poRaster);
    else
        ReadGroups(*poRaster);
}

// Every group is read into one scratch block; then the result is made block by block from all of them.
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
    const Scratch oScratch(static_cast<unsigned char*>(HMalloc(nScratchBytes)));

    std::vector<Run> oRuns;
    unsigned int nPlaced = 0;
    for (std::size_t nGroup = 0; nGroup < mpoState->moGroups.size(); ++nGroup)
    {
        const Group& oGroup = mpoState->moGroups[nGroup];
        unsigned char* const pPart = oScratch.get() + oOffsets[nGroup];
        const krv::gobs::RasterInfo oInfo(oRaster.GetWidth(), oRaster.GetHeight(),
                                          static_cast<unsigned int>(oGroup.moPositions.size()),
                                          oGroup.mpoReader->GetDataType());
        krv::gobs::Raster oPart(oInfo, oRaster.GetContext(), pPart, false);
        oGroup.mpoReader->ReadRaster(&oPart);
        AddRuns(oGroup, pPart, mpoState->mePlacement, oRuns);
        nPlaced += oGroup.mbConsecutive || mpoState->mePlacement == eOwnPlace
                       ? static_cast<unsigned int>(oGroup.moPositions.size())
                       : 0;
    }
    if (nPlaced != GetChansCount())
        std::memset(oRaster.GetBuffer(), 0, oRaster.GetBufferSize()); // not every channel is placed on

    const auto eTarget = krv::gobs::QRFDataType2RasterBufferType(mpoState->moType);
    const std::uint64_t nValueBytes = mpoState->moType.GetValueBits() / 8;
    const std::uint64_t nChannels = GetChansCount();
    const std::uint64_t nPixels = oRaster.GetFullWidth() * oRaster.GetFullHeight();
    for (std::uint64_t nFirst = 0; nFirst < nPixels; nFirst += BLOCK_PIXELS)
    {
        const std::uint64_t nCount = std::min(BLOCK_PIXELS, nPixels - nFirst);
        for (const Run& oRun : oRuns)
            krv::raster::CopyData(oRun.mpSource + nFirst * oRun.mnSourcePixelBytes, oRun.meSource, oRun.mnSourceStride,
                                  oRaster.GetBuffer() + (nFirst * nChannels + oRun.mnTarget) * nValueBytes, eTarget,
                                  nChannels, nCount, oRun.mnChannels);
    }
}

RasterIterator MultiTypeReader::FindRaster(unsigned int nX, unsigned int nY)
{
    return RasterIterator(this, mpoState->moTiles.GetTileIndex(nX, nY));
}

RasterIterator MultiTypeReader::Begin()
{
    return RasterIterator(this);
}

RasterIterator MultiTypeReader::End()
{
    return RasterIterator(this, GetTileCount());
}

unsigned int MultiTypeReader::GetTileCount() const
{
    return mpoState->moTiles.GetTileRange() + 1;
}

void MultiTypeReader::SetOptimalTileSize()
{
    IRasterReader& oFirst = mpoState->First();
    oFirst.SetOptimalTileSize();
    SetTileSize(oFirst.GetTileWidth(), oFirst.GetTileHeight());
}

// A size that the grid refuses changes no group.
void MultiTypeReader::SetTileSize(unsigned int nWidth, unsigned int nHeight)
{
    mpoState->moTiles.SetChunkSize(nWidth, nHeight);
    for (const Group& oGroup : mpoState->moGroups)
        oGroup.mpoReader->SetTileSize(nWidth, nHeight);
}

// Every group takes the call, so that all end in the same state; the first failure passes afterwards.
void MultiTypeReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    std::exception_ptr oFailure;
    for (const Group& oGroup : mpoState->moGroups)
    {
        try
        {
            oGroup.mpoReader->SetMargins(nXMargin, nYMargin, eBehaviour);
        }
        catch (...)
        {
            if (oFailure == nullptr)
                oFailure = std::current_exception();
        }
    }
    if (oFailure != nullptr)
        std::rethrow_exception(oFailure);
}

IOverviewReaderAccessor* MultiTypeReader::GetOverviewReaderAccessor()
{
    if (mpoState->mbOverviewsDisabled)
        return nullptr;
    return new MultiTypeOverviewReaderAccessor(dynamic_cast<IRasterDataset*>(mpoState->mpoDataset),
                                               mpoState->moChannels, mpoState->moType);
}

AuxiliaryData MultiTypeReader::GetAuxiliaryData() const
{
    return detail::SelectChannelData(*mpoState->mpoDataset, mpoState->moChannels);
}

unsigned int MultiTypeReader::GetTileWidth() const
{
    return mpoState->First().GetTileWidth();
}

unsigned int MultiTypeReader::GetTileHeight() const
{
    return mpoState->First().GetTileHeight();
}

const std::vector<IChannelInfo*>& MultiTypeReader::GetChannelsInfo() const
{
    return mpoState->moInfos.Get();
}

IFileFormat* MultiTypeReader::GetFileFormat() const
{
    return mpoState->First().GetFileFormat();
}

unsigned int MultiTypeReader::GetXMargin() const
{
    return mpoState->First().GetXMargin();
}

unsigned int MultiTypeReader::GetYMargin() const
{
    return mpoState->First().GetYMargin();
}

eMarginBehaviour MultiTypeReader::GetMarginBehaviour() const
{
    return mpoState->First().GetMarginBehaviour();
}

krv::ogc::cs::ICRS* MultiTypeReader::GetCRS() const
{
    return mpoState->First().GetCRS();
}

krv::ogc::cs::GeocodingInfo* MultiTypeReader::GetGeocodingInfo() const
{
    return mpoState->First().GetGeocodingInfo();
}

unsigned int MultiTypeReader::GetWidth() const
{
    return mpoState->First().GetWidth();
}

unsigned int MultiTypeReader::GetHeight() const
{
    return mpoState->First().GetHeight();
}

unsigned int MultiTypeReader::GetChansCount() const
{
    return static_cast<unsigned int>(mpoState->moChannels.size());
}

const krv::gobs::DataType& MultiTypeReader::GetDataType() const
{
    return mpoState->moType;
}

} // namespace krv::datasources
