#include "gobs/mask/maskdecision.h"

#include "gobs/mask/detail/backgroundtest.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::gobs
{

namespace
{

std::unique_ptr<IMaskDecisionImpl> MakeImpl(const DataType& oType, unsigned long long nChannels, BkgdRule eRule,
                                            const std::vector<double>& oValues,
                                            const std::vector<unsigned int>& oChannels, const Place& oPlace)
{
    detail::CheckDecision(eRule, oValues.size(), oChannels.size(), oPlace);
    std::vector<SampleValue> oSamples;
    oSamples.reserve(oValues.size());
    for (const double nValue : oValues)
        oSamples.push_back(SampleValue::FromReal(nValue));
    return detail::MakeBackgroundTest({oSamples, oChannels, eRule, false}, oType, nChannels, oPlace);
}

std::shared_ptr<const IMaskDecision> CloneOf(const IMaskDecision* poDecision, const Place& oPlace)
{
    if (poDecision == nullptr)
        throw DataException("The mask decision is NULL", oPlace);
    return std::shared_ptr<const IMaskDecision>(poDecision->Clone());
}

} // namespace

IMaskDecisionImpl::~IMaskDecisionImpl() = default;

IMaskDecision::~IMaskDecision() = default;

MaskDecision::MaskDecision(BkgdRule eRule, const std::vector<double>& oValues,
                           const std::vector<unsigned int>& oChannels)
    : meRule(eRule), moValues(oValues), moChannels(oChannels)
{
    detail::CheckDecision(meRule, moValues.size(), moChannels.size(), Place::Current());
}

MaskDecision::~MaskDecision() = default;

IMaskDecision* MaskDecision::Clone() const
{
    return new MaskDecision(*this);
}

IMaskDecisionImpl* MaskDecision::GetImpl(const DataType& oType, unsigned long long nChannels) const
{
    return MakeImpl(oType, nChannels, meRule, moValues, moChannels, Place::Current()).release();
}

MaskDecisionBuilder::MaskDecisionBuilder(const IMaskDecision* poDecision)
    : mpoDecision(CloneOf(poDecision, Place::Current()))
{
}

MaskDecisionBuilder::~MaskDecisionBuilder() = default;

Mask* MaskDecisionBuilder::BuildMask(const Raster& oRaster) const
{
    const std::unique_ptr<IMaskDecisionImpl> oImpl(
        mpoDecision->GetImpl(oRaster.GetDataType(), oRaster.GetChansCount()));
    if (oImpl == nullptr)
        throw DataException("The mask decision gave no implementation for the type " +
                            oRaster.GetDataType().Describe());
    auto oMask = std::make_unique<Mask>(oRaster.GetInfo(), oRaster.GetContext());
    oImpl->Mark(oRaster.GetBuffer(), oRaster.GetFullWidth() * oRaster.GetFullHeight(), oRaster.GetChansCount(),
                oMask->GetBits());
    return oMask.release();
}

IMaskDecisionImpl*
GetMaskDecisionImpl(DataType oType, unsigned long long nChannels, BkgdRule eRule,
                    std::vector<double> oValues,         // NOLINT(performance-unnecessary-value-param)
                    std::vector<unsigned int> oChannels) // NOLINT(performance-unnecessary-value-param)
{
    return MakeImpl(oType, nChannels, eRule, oValues, oChannels, Place::Current()).release();
}

} // namespace krv::gobs
