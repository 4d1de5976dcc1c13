#include "datasources/reader/multitypeoverviewreaderaccessor.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/multitypereader.h"

namespace krv::datasources
{

MultiTypeOverviewReaderAccessor::MultiTypeOverviewReaderAccessor(IRasterDataset* poRasterDataset,
                                                                 const std::vector<unsigned int>& oReadChannels,
                                                                 const krv::gobs::DataType& oType)
    : mpoLevels(std::make_unique<BasicOverviewReaderAccessor>(poRasterDataset, oReadChannels)),
      mpoRasterDataset(poRasterDataset), moReadChannels(oReadChannels), moType(oType)
{
}

MultiTypeOverviewReaderAccessor::~MultiTypeOverviewReaderAccessor() = default;

std::vector<unsigned int> MultiTypeOverviewReaderAccessor::GetLevels() const
{
    return mpoLevels->GetLevels();
}

bool MultiTypeOverviewReaderAccessor::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    return mpoLevels->IsValid(nChannel, nLevel);
}

bool MultiTypeOverviewReaderAccessor::IsLevelValid(unsigned int nLevel) const
{
    return mpoLevels->IsLevelValid(nLevel);
}

AuxiliaryData MultiTypeOverviewReaderAccessor::GetAuxiliaryData(unsigned int nLevel)
{
    return mpoLevels->GetAuxiliaryData(nLevel);
}

unsigned int MultiTypeOverviewReaderAccessor::GetChanCount() const
{
    return mpoLevels->GetChanCount();
}

IRasterReader* MultiTypeOverviewReaderAccessor::CreateRasterReader(unsigned int nLevel)
{
    std::vector<std::unique_ptr<IRasterReader>> oOwned;
    oOwned.reserve(moReadChannels.size());
    for (const unsigned int nChannel : moReadChannels)
        oOwned.emplace_back(mpoLevels->CreateRasterReader(nLevel, {nChannel}));
    std::vector<IRasterReader*> oReaders;
    oReaders.reserve(oOwned.size());
    for (auto& oReader : oOwned)
        oReaders.push_back(oReader.release());
    return new MultiTypeReader(dynamic_cast<IDataset*>(mpoRasterDataset), oReaders, moReadChannels, moType);
}

} // namespace krv::datasources
