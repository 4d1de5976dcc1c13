#pragma once

#include "gobs/mask/maskdecision.h"
#include "gobs/mask/samplevalue.h"
#include "toolkit/exceptions/place.h"

#include <memory>
#include <vector>

namespace krv::gobs::detail
{

// What is background; the lists pair up by position and outlive the call that they are handed to.
struct BackgroundRule
{
    const std::vector<SampleValue>& moValues;
    const std::vector<unsigned int>& moChannels;
    BkgdRule meRule;
    bool mbNaNIsBackground;
};

// Throws DataException for lists of different lengths, ParameterException for an unknown rule.
void CheckDecision(BkgdRule eRule, std::size_t nValues, std::size_t nChannels, const Place& oPlace);

// The test for one pixel type. Throws DataException for a type outside the table.
std::unique_ptr<IMaskDecisionImpl> MakeBackgroundTest(const BackgroundRule& oRule, const DataType& oType,
                                                      unsigned long long nChannels, const Place& oPlace);

} // namespace krv::gobs::detail
