#pragma once

#include "gobs/mask/maskdecision.h"
#include "gobs/mask/samplevalue.h"

namespace krv::gobs
{

// As MaskDecision, for values that a double cannot hold: 64-bit integers are compared exactly. On request a NaN sample
// of a listed channel of real type, both parts of a complex one, is background too, whatever the channel's value.
// Empty lists mark nothing; channels count from 1, and those that a raster lacks take no part.
class KRV_GOBS_API ExactMaskDecision : public IMaskDecision
{
public:
    // Throws DataException for lists of different lengths, ParameterException for an unknown rule.
    ExactMaskDecision(BkgdRule eRule, const std::vector<SampleValue>& oValues,
                      const std::vector<unsigned int>& oChannels, bool bNaNIsBackground = false);
    ~ExactMaskDecision() override;

    // Both results are new objects that the caller owns.
    IMaskDecision* Clone() const override;

    // Each call gives a new object.
    IMaskDecisionImpl* GetImpl(const DataType& oType, unsigned long long nChannels) const override;

    // As the constructor got them, here and below.
    BkgdRule GetRule() const { return meRule; }
    const std::vector<SampleValue>& GetValues() const { return moValues; }
    const std::vector<unsigned int>& GetChannels() const { return moChannels; }
    bool IsNaNBackground() const { return mbNaNIsBackground; }

private:
    BkgdRule meRule;
    std::vector<SampleValue> moValues;    // one for each channel of the list
    std::vector<unsigned int> moChannels; // from 1
    bool mbNaNIsBackground;
};

} // namespace krv::gobs
