#include "datasources/reader/derived/derivedoverviewreaderaccessor.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/irasterreader.h"
#include "toolkit/exceptions/exceptions.h"

#include <string>
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
    return moWrap(OpenWrapped(nLevel)).release();
}

std::unique_ptr<IRasterReader> DerivedOverviewReaderAccessor::OpenWrapped(unsigned int nLevel)
{
    std::unique_ptr<IRasterReader> poLevel(mpoLevels->CreateRasterReader(nLevel));
    if (poLevel == nullptr)
        throw krv::DataException("The source gave no reader of level " + std::to_string(nLevel));
    return poLevel;
}

} // namespace krv::datasources
