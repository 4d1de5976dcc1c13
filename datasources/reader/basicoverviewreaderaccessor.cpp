#include "datasources/reader/basicoverviewreaderaccessor.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/detail/leveldata.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::datasources
{

// The dataset whose overviews are used, and its manager. A second opening goes before the manager that came from it,
// intended: managers touch no dataset while they are destroyed.
struct BasicOverviewReaderAccessor::Source
{
    bool HasLevels() const { return mpoManager != nullptr && !mpoManager->GetLevels().empty(); }

    std::unique_ptr<IOverviewManager> mpoManager;
    std::unique_ptr<IDataset> mpoOwnedDataset;
    IRasterDataset* mpoRasterDataset = nullptr; // borrowed, or a facet of mpoOwnedDataset
};

namespace
{

std::unique_ptr<IDataset> OpenGeneric(IRasterDataset* poRasterDataset)
{
    auto* const poDataset = dynamic_cast<IDataset*>(poRasterDataset);
    if (poDataset == nullptr)
        return nullptr;
    return std::unique_ptr<IDataset>(
        DatasetManager::GetInstance()->OpenFormat("GDBALL", poDataset->GetName(), eReadOnly));
}

} // namespace

BasicOverviewReaderAccessor::BasicOverviewReaderAccessor(IRasterDataset* poRasterDataset,
                                                         const std::vector<unsigned int>& oReadChannels)
{
    if (poRasterDataset == nullptr)
        throw krv::DataException("The raster dataset is NULL");
    if (oReadChannels.empty())
        throw krv::DataException("oReadChans is empty");
    moReadChannels = oReadChannels;
    mpoSource = std::make_shared<Source>();
    mpoSource->mpoRasterDataset = poRasterDataset;
    mpoSource->mpoManager.reset(poRasterDataset->GetOverviewManager());
    if (mpoSource->HasLevels())
        return;

    const auto oSecond = std::make_shared<Source>();
    oSecond->mpoOwnedDataset = OpenGeneric(poRasterDataset);
    oSecond->mpoRasterDataset = dynamic_cast<IRasterDataset*>(oSecond->mpoOwnedDataset.get());
    if (oSecond->mpoRasterDataset == nullptr)
        return;
    oSecond->mpoManager.reset(oSecond->mpoRasterDataset->GetOverviewManager());
    if (oSecond->HasLevels())
        mpoSource = oSecond;
    else
        oSecond->mpoManager.reset();
}

BasicOverviewReaderAccessor::BasicOverviewReaderAccessor(const BasicOverviewReaderAccessor& oOther) = default;
BasicOverviewReaderAccessor&
BasicOverviewReaderAccessor::operator=(const BasicOverviewReaderAccessor& oOther) = default;
BasicOverviewReaderAccessor::~BasicOverviewReaderAccessor() = default;

std::vector<unsigned int> BasicOverviewReaderAccessor::GetLevels() const
{
    return mpoSource->mpoManager != nullptr ? mpoSource->mpoManager->GetLevels() : std::vector<unsigned int>();
}

bool BasicOverviewReaderAccessor::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const unsigned int nFileChannel = detail::ChannelAt(moReadChannels, nChannel, Place::Current());
    return mpoSource->mpoManager != nullptr && mpoSource->mpoManager->IsValid(nFileChannel, nLevel);
}

bool BasicOverviewReaderAccessor::IsLevelValid(unsigned int nLevel) const
{
    const IOverviewManager* const poManager = mpoSource->mpoManager.get();
    return poManager != nullptr &&
           std::all_of(moReadChannels.begin(), moReadChannels.end(),
                       [&](unsigned int nChannel) { return poManager->IsValid(nChannel, nLevel); });
}

AuxiliaryData BasicOverviewReaderAccessor::GetAuxiliaryData(unsigned int nLevel)
{
    if (mpoSource->mpoManager == nullptr)
        return AuxiliaryData(GetChanCount());
    return detail::SelectLevelData(mpoSource->mpoManager->GetAuxiliaryData(nLevel), moReadChannels);
}

unsigned int BasicOverviewReaderAccessor::GetChanCount() const
{
    return static_cast<unsigned int>(moReadChannels.size());
}

IRasterReader* BasicOverviewReaderAccessor::CreateRasterReader(unsigned int nLevel)
{
    return CreateRasterReader(nLevel, moReadChannels);
}

IRasterReader* BasicOverviewReaderAccessor::CreateRasterReader(unsigned int nLevel,
                                                               const std::vector<unsigned int>& oChannels)
{
    if (mpoSource->mpoManager == nullptr)
        throw krv::DataException("The dataset has no overviews");
    return new BasicReader(mpoSource->mpoRasterDataset, mpoSource->mpoManager->GetOverviewIO(nLevel, oChannels),
                           oChannels);
}

} // namespace krv::datasources
