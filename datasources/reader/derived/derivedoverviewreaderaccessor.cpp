#include "datasources/reader/derived/derivedoverviewreaderaccessor.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/irasterreader.h"

#include <utility>

namespace krv::datasources
{

DerivedOverviewReaderAccessor::DerivedOverviewReaderAccessor(std::unique_ptr<IOverviewReaderAccessor> poLevels,
                                                             LevelWrapper oWrap)
    : mpoLevels(std::move(poLevels)), moWrap(std::move(oWrap))
{
}

DerivedOverviewReaderAccessor::~DerivedOverviewReaderAccessor() = default;

AuxiliaryData DerivedOverviewReaderAccessor::GetAuxiliaryData(unsigned int nLevel)
{
    return mpoLevels->GetAuxiliaryData(nLevel);
}

IRasterReader* DerivedOverviewReaderAccessor::CreateRasterReader(unsigned int nLevel)
{
    return moWrap(std::unique_ptr<IRasterReader>(mpoLevels->CreateRasterReader(nLevel))).release();
}

} // namespace krv::datasources
