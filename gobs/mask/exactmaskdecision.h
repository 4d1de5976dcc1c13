#pragma once

#include "gobs/mask/maskdecision.h"
#include "gobs/mask/samplevalue.h"

namespace krv::gobs
{

// As MaskDecision, for values that a double cannot hold: 64-bit integers are compared exactly. On request a NaN sample
// of a listed channel of real type, both parts of a complex one, is background too, whatever the channel's value.
class KRV_GOBS_API ExactMaskDecision : public IMaskDecision
{
public:
    // Throws DataException for lists of different lengths, ParameterException for an unknown rule.
    ExactMaskDecision(BkgdRule eRule, const std::vector<SampleValue>& oValues,
                      const std::vector<unsigned int>& oChannels, bool bNaNIsBackground = false);
    ~ExactMaskDecision() override;

    IMaskDecision* Clone() const override;
    IMaskDecisionImpl* GetImpl(const DataType& oType, unsigned long long nChannels) const override;

    BkgdRule GetRule() const { return meRule; }
    const std::vector<SampleValue>& GetValues() const { return moValues; }
    const std::vector<unsigned int>& GetChannels() const { return moChannels; }
    bool IsNaNBackground() const { return mbNaNIsBackground; }

private:
    BkgdRule meRule;
    std::vector<SampleValue> moValues;
    std::vector<unsigned int> moChannels;
    bool mbNaNIsBackground;
};

} // namespace krv::gobs
