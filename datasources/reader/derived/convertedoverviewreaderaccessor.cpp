#include "datasources/reader/derived/convertedoverviewreaderaccessor.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/irasterreader.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::datasources
{

ConvertedOverviewReaderAccessor::ConvertedOverviewReaderAccessor(std::unique_ptr<IOverviewReaderAccessor> poLevels,
                                                                 ConvertedLevels oRules)
    : DerivedOverviewReaderAccessor(std::move(poLevels), oRules.moWrap), moRules(std::move(oRules))
{
}

ConvertedOverviewReaderAccessor::~ConvertedOverviewReaderAccessor() = default;

std::vector<unsigned int> ConvertedOverviewReaderAccessor::GetLevels() const
{
    std::vector<unsigned int> oLevels = DerivedOverviewReaderAccessor::GetLevels();
    std::erase_if(oLevels, [&](unsigned int nLevel) { return !moRules.moServes(nLevel); });
    return oLevels;
}

bool ConvertedOverviewReaderAccessor::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    if (nChannel == 0 || nChannel > moRules.mnChannels)
        throw krv::OutOfBoundsException({nChannel}, "Out of bounds.");
    return IsLevelValid(nLevel);
}

bool ConvertedOverviewReaderAccessor::IsLevelValid(unsigned int nLevel) const
{
    return DerivedOverviewReaderAccessor::IsLevelValid(nLevel) && moRules.moServes(nLevel);
}

AuxiliaryData ConvertedOverviewReaderAccessor::GetAuxiliaryData(unsigned int nLevel)
{
    return moRules.moConvert(DerivedOverviewReaderAccessor::GetAuxiliaryData(nLevel));
}

IRasterReader* ConvertedOverviewReaderAccessor::CreateRasterReader(unsigned int nLevel)
{
    if (!moRules.moServes(nLevel))
        throw krv::DataException("Level " + std::to_string(nLevel) +
                                 " is not offered: it holds means of values that must not be mixed");
    return DerivedOverviewReaderAccessor::CreateRasterReader(nLevel);
}

} // namespace krv::datasources
