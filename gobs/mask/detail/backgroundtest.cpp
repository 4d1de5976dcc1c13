#include "gobs/mask/detail/backgroundtest.h"

#include "gobs/mask/detail/backgroundkernel.h"
#include "gobs/mask/detail/bitkernel.h"
#include "gobs/raster/pixelvalue.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <bit>
#include <map>

namespace krv::gobs::detail
{

namespace
{

// Several kernels in turn: each has one test per channel, their bits combine by the rule.
template <class Kernel>
class BackgroundTest : public IMaskDecisionImpl
{
public:
    BackgroundTest(std::vector<Kernel> oKernels, unsigned long long nChannels, BkgdRule eRule)
        : moKernels(std::move(oKernels)), mnChannels(nChannels), meRule(eRule)
    {
    }

    void Mark(const unsigned char* pPixels, unsigned long long nPixels, unsigned int nChannels,
              unsigned char* pBits) const override
    {
        if (nChannels != mnChannels)
            throw DataException("The mask decision was made for " + std::to_string(mnChannels) +
                                " channels, the pixels have " + std::to_string(nChannels));
        moKernels[0].Mark(pPixels, nPixels, pBits);
        if (moKernels.size() > 1)
            Combine(pPixels, nPixels, pBits);
    }

private:
    void Combine(const unsigned char* pPixels, std::size_t nPixels, unsigned char* pBits) const
    {
        std::vector<unsigned char> oBits((nPixels + 7) / 8);
        for (std::size_t n = 1; n < moKernels.size(); ++n)
        {
            moKernels[n].Mark(pPixels, nPixels, oBits.data());
            for (std::size_t nByte = 0; nByte < oBits.size(); ++nByte)
                pBits[nByte] = meRule == eAllChannels ? pBits[nByte] & oBits[nByte] : pBits[nByte] | oBits[nByte];
        }
    }

    std::vector<Kernel> moKernels;
    unsigned long long mnChannels;
    BkgdRule meRule;
};

// The tests of the listed channels that there are. A value that no sample can equal decides for all channels, and is
// left out for any.
template <class Sample, class Convert>
std::vector<SampleTest<Sample>> CollectTests(const BackgroundRule& oRule, unsigned long long nChannels,
                                             const Convert& oConvert)
{
    std::vector<SampleTest<Sample>> oTests;
    for (std::size_t n = 0; n < oRule.moChannels.size(); ++n)
    {
        const unsigned int nChannel = oRule.moChannels[n];
        if (nChannel == 0 || nChannel > nChannels)
            continue;
        if (const auto oTest = oConvert(oRule.moValues[n]))
            oTests.push_back({nChannel - 1, oTest->first, oTest->second});
        else if (oRule.meRule == eAllChannels)
            return {};
    }
    return oTests;
}

// Deals the tests out, so that no kernel has two for one channel.
template <class Sample>
std::vector<std::vector<SampleTest<Sample>>> Deal(const std::vector<SampleTest<Sample>>& oTests)
{
    std::vector<std::vector<SampleTest<Sample>>> oDealt(1);
    std::map<unsigned int, std::size_t> oCounts;
    for (const SampleTest<Sample>& oTest : oTests)
    {
        const std::size_t nTurn = oCounts[oTest.mnChannel]++;
        oDealt.resize(std::max(oDealt.size(), nTurn + 1));
        oDealt[nTurn].push_back(oTest);
    }
    return oDealt;
}

template <class Kernel, class Sample, class Convert>
std::unique_ptr<IMaskDecisionImpl> Make(const BackgroundRule& oRule, unsigned long long nChannels,
                                        const Convert& oConvert)
{
    std::vector<Kernel> oKernels;
    for (const auto& oTests : Deal(CollectTests<Sample>(oRule, nChannels, oConvert)))
        oKernels.emplace_back(oTests, nChannels, oRule.meRule);
    return std::make_unique<BackgroundTest<Kernel>>(std::move(oKernels), nChannels, oRule.meRule);
}

template <class Sample>
using ValueAndNaN = std::optional<std::pair<Sample, bool>>;

// Integers, and pairs of them, are compared by their bits.
template <class Value>
std::unique_ptr<IMaskDecisionImpl> MakeInteger(const BackgroundRule& oRule, unsigned long long nChannels)
{
    using Bits = BitsOf<Value>;
    const auto oConvert = [](const SampleValue& oValue) -> ValueAndNaN<Bits>
    {
        const auto oSample = ToSample<PartOf<Value>>(oValue);
        if (!oSample)
            return std::nullopt;
        if constexpr (PARTS_OF<Value> == 1)
            return std::pair(std::bit_cast<Bits>(*oSample), false);
        else
            return std::pair(std::bit_cast<Bits>(Value{*oSample, 0}), false);
    };
    return Make<BackgroundKernel<Bits>, Bits>(oRule, nChannels, oConvert);
}

template <class Value>
std::unique_ptr<IMaskDecisionImpl> MakeReal(const BackgroundRule& oRule, unsigned long long nChannels)
{
    using Real = PartOf<Value>;
    // A NaN to compare with matches nothing by itself.
    const auto oConvert = [&](const SampleValue& oValue) -> ValueAndNaN<Value>
    {
        const std::optional<Real> oSample = ToSample<Real>(oValue);
        const bool bNaN = oValue.IsNaN() || oRule.mbNaNIsBackground;
        if (!oSample && !bNaN)
            return std::nullopt;
        const Real nReal = oSample.value_or(std::numeric_limits<Real>::quiet_NaN());
        if constexpr (PARTS_OF<Value> == 1)
            return std::pair(nReal, bNaN);
        else
            return std::pair(Value{nReal, IsNaN(nReal) ? nReal : Real(0)}, bNaN);
    };
    return Make<BackgroundKernel<Value>, Value>(oRule, nChannels, oConvert);
}

std::unique_ptr<IMaskDecisionImpl> MakeBits(const BackgroundRule& oRule, unsigned long long nChannels)
{
    const auto oConvert = [](const SampleValue& oValue) -> ValueAndNaN<unsigned char>
    {
        const std::optional<unsigned char> oBit = ToSample<unsigned char>(oValue);
        if (!oBit || *oBit > 1)
            return std::nullopt;
        return std::pair(*oBit, false);
    };
    return Make<BitKernel, unsigned char>(oRule, nChannels, oConvert);
}

} // namespace

void CheckDecision(BkgdRule eRule, std::size_t nValues, std::size_t nChannels, const Place& oPlace)
{
    if (eRule != eAnyChannel && eRule != eAllChannels)
        throw ParameterException("Unknown background rule", ParameterException::eInvalidValue, "eRule", oPlace);
    if (nValues != nChannels)
        throw DataException("A mask decision needs one value for each channel: " + std::to_string(nValues) +
                                " values, " + std::to_string(nChannels) + " channels",
                            oPlace);
}

std::unique_ptr<IMaskDecisionImpl> MakeBackgroundTest(const BackgroundRule& oRule, const DataType& oType,
                                                      unsigned long long nChannels, const Place& oPlace)
{
    if (oType == eDT_BIT)
        return MakeBits(oRule, nChannels);
    const auto MakeTest = [&]<class Value>(std::type_identity<Value>)
    {
        if constexpr (std::is_floating_point_v<PartOf<Value>>)
            return MakeReal<Value>(oRule, nChannels);
        else
            return MakeInteger<Value>(oRule, nChannels);
    };
    return VisitPixelType(oType, MakeTest, oPlace);
}

} // namespace krv::gobs::detail
