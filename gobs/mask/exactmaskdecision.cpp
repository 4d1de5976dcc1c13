#include "gobs/mask/exactmaskdecision.h"

#include "gobs/mask/detail/backgroundtest.h"

namespace krv::gobs
{

ExactMaskDecision::ExactMaskDecision(BkgdRule eRule, const std::vector<SampleValue>& oValues,
                                     const std::vector<unsigned int>& oChannels, bool bNaNIsBackground)
    : meRule(eRule), moValues(oValues), moChannels(oChannels), mbNaNIsBackground(bNaNIsBackground)
{
    detail::CheckDecision(meRule, moValues.size(), moChannels.size(), Place::Current());
}

ExactMaskDecision::~ExactMaskDecision() = default;

IMaskDecision* ExactMaskDecision::Clone() const
{
    return new ExactMaskDecision(*this);
}

IMaskDecisionImpl* ExactMaskDecision::GetImpl(const DataType& oType, unsigned long long nChannels) const
{
    return detail::MakeBackgroundTest({moValues, moChannels, meRule, mbNaNIsBackground}, oType, nChannels,
                                      Place::Current())
        .release();
}

} // namespace krv::gobs
