#include "datasources/reader/multitypeoverviewreaderaccessor.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/multitypereader.h"

namespace krv::datasources
{

MultiTypeOverviewReaderAccessor::MultiTypeOverviewReaderAccessor(IRasterDataset* poRasterDataset,
                                                                 const std::vector<unsigned int>& oReadChannels,
                                                                 const krv::gobs::DataType& oType)
    : DerivedOverviewReaderAccessor(std::make_unique<BasicOverviewReaderAccessor>(poRasterDataset, oReadChannels)),
      mpoRasterDataset(poRasterDataset), moReadChannels(oReadChannels), moType(oType)
{
}

MultiTypeOverviewReaderAccessor::~MultiTypeOverviewReaderAccessor() = default;

IRasterReader* MultiTypeOverviewReaderAccessor::CreateRasterReader(unsigned int nLevel)
{
    auto& oLevels = static_cast<BasicOverviewReaderAccessor&>(GetWrapped());
    std::vector<std::unique_ptr<IRasterReader>> oOwned;
    oOwned.reserve(moReadChannels.size());
    for (const unsigned int nChannel : moReadChannels)
        oOwned.emplace_back(oLevels.CreateRasterReader(nLevel, {nChannel}));
    std::vector<IRasterReader*> oReaders;
    oReaders.reserve(oOwned.size());
    for (auto& oReader : oOwned)
        oReaders.push_back(oReader.release());
    return new MultiTypeReader(dynamic_cast<IDataset*>(mpoRasterDataset), oReaders, moReadChannels, moType);
}

} // namespace krv::datasources
