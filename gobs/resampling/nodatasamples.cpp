#include "gobs/resampling/nodatasamples.h"

#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/detail/samplevectors.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>
#include <utility>

namespace krv::gobs
{

namespace
{

template <typename T>
T Beside(T nValue)
{
    const bool bUp = nValue < std::numeric_limits<T>::max();
    if constexpr (std::is_floating_point_v<T>)
        return std::nextafter(nValue, bUp ? std::numeric_limits<T>::infinity() : T(0));
    else
        return static_cast<T>(bUp ? nValue + 1 : nValue - 1);
}

// What a channel's samples are compared with, for real types and their options.
template <typename T>
struct ChannelRule
{
    bool mbNoData = false; // there is a value, maybe NaN
    T mnValue = T(0);      // of what is not valid
    bool mbNaN = false;    // NaN samples are not valid
};

template <typename T>
std::vector<ChannelRule<T>> MakeRules(const NoDataNumbers& oNumbers, bool bNaNIsNoData)
{
    std::vector<ChannelRule<T>> oRules;
    for (const std::optional<SampleValue>& oNumber : oNumbers)
    {
        const SampleMatch<T> oMatch(oNumber);
        ChannelRule<T> oRule{oMatch.IsSet(), oMatch.GetValue(), oMatch.GetValue() != oMatch.GetValue()};
        if (bNaNIsNoData && std::is_floating_point_v<T>)
        {
            oRule.mbNaN = true;
            if (!oRule.mbNoData)
                oRule = {true, std::numeric_limits<T>::quiet_NaN(), true};
        }
        oRules.push_back(oRule);
    }
    return oRules;
}

// Whether a valid sample could equal a value by accident: NaN equals nothing.
template <typename T>
bool HasValue(const std::vector<ChannelRule<T>>& oRules)
{
    return std::any_of(oRules.begin(), oRules.end(),
                       [](const auto& oRule) { return oRule.mbNoData && oRule.mnValue == oRule.mnValue; });
}

// The rules of all channels, laid out as samples lie in rows: after as many vectors as there are channels it begins
// anew. Of three channels in lanes of 32 bits:
//     samples   a0 b0 c0 a1 | b1 c1 a2 b2 | c2 a3 b3 c3 | a4 ..
//     values    A  B  C  A  | B  C  A  B  | C  A  B  C  | A  ..
template <typename T>
class Pattern
{
public:
    using Samples = typename detail::VectorsOf<T>::Samples;
    using Bits = typename detail::VectorsOf<T>::Bits;
    static constexpr std::size_t LANES = detail::VectorsOf<T>::LANES;

    explicit Pattern(const std::vector<ChannelRule<T>>& oRules) : moVectors(oRules.size())
    {
        std::vector<T> oValues, oBeside;
        std::vector<BitsOf<T>> oSet, oNaN;
        for (std::size_t n = 0; n < LANES * oRules.size(); ++n)
        {
            const ChannelRule<T>& oRule = oRules[n % oRules.size()];
            oValues.push_back(oRule.mnValue);
            oBeside.push_back(Beside(oRule.mnValue));
            oSet.push_back(static_cast<BitsOf<T>>(oRule.mbNoData ? ~BitsOf<T>(0) : BitsOf<T>(0)));
            oNaN.push_back(static_cast<BitsOf<T>>(oRule.mbNaN ? ~BitsOf<T>(0) : BitsOf<T>(0)));
        }
        for (std::size_t n = 0; n < moVectors.size(); ++n)
            moVectors[n] = {simd::Load<Samples>(&oValues[n * LANES]), simd::Load<Samples>(&oBeside[n * LANES]),
                            simd::Load<Bits>(&oSet[n * LANES]), simd::Load<Bits>(&oNaN[n * LANES])};
    }

    // All bits set in the lanes of samples that equal their channel's value, or are NaN where that counts.
    Bits Match(const Samples& oSamples, std::size_t nVector) const
    {
        Bits oFound = reinterpret_cast<Bits>(oSamples == moVectors[nVector].moValues) & moVectors[nVector].moSet;
        if constexpr (std::is_floating_point_v<T>)
            oFound |= reinterpret_cast<Bits>(oSamples != oSamples) & moVectors[nVector].moNaN;
        return oFound;
    }
    // Lanes of valid samples that equal the value get the one beside it, lanes that are not valid the value.
    Samples Settle(const Samples& oSamples, const Bits& oInvalid, std::size_t nVector) const
    {
        const Vector& oVector = moVectors[nVector];
        const Bits oClash = reinterpret_cast<Bits>(oSamples == oVector.moValues) & oVector.moSet & ~oInvalid;
        const Bits oKept = ~(oClash | oInvalid);
        return reinterpret_cast<Samples>((reinterpret_cast<Bits>(oSamples) & oKept) |
                                         (reinterpret_cast<Bits>(oVector.moBeside) & oClash) |
                                         (reinterpret_cast<Bits>(oVector.moValues) & oInvalid));
    }
    std::size_t Next(std::size_t nVector) const { return nVector + 1 == moVectors.size() ? 0 : nVector + 1; }

private:
    struct Vector
    {
        Samples moValues;
        Samples moBeside;
        Bits moSet;
        Bits moNaN;
    };
    std::vector<Vector> moVectors;
};

// Takes nSamples samples from the first channel on vector by vector; the last one may reach over the end, as a copy.
template <typename T, typename Action>
void ForVectors(const Pattern<T>& oPattern, std::size_t nSamples, const Action& oAction)
{
    std::size_t nVector = 0;
    for (std::size_t n = 0; n < nSamples; n += Pattern<T>::LANES, nVector = oPattern.Next(nVector))
        oAction(n, std::min(Pattern<T>::LANES, nSamples - n), nVector);
}

template <typename T>
class SampleTest : public ISampleTest
{
public:
    explicit SampleTest(const std::vector<ChannelRule<T>>& oRules) : moPattern(oRules) {}

    bool FindsAny(const unsigned char* pSamples, std::size_t nSamples) const override
    {
        Bits oAny{};
        ForVectors(moPattern, nSamples,
                   [&](std::size_t nAt, std::size_t nCount, std::size_t nVector)
                   { oAny |= MatchAt(pSamples + nAt * sizeof(T), nCount, nVector); });
        const Bits oNone{};
        return std::memcmp(&oAny, &oNone, sizeof oAny) != 0;
    }

    void Mark(const unsigned char* pSamples, std::size_t nSamples, unsigned char* pValid) const override
    {
        ForVectors(moPattern, nSamples,
                   [&](std::size_t nAt, std::size_t nCount, std::size_t nVector)
                   {
                       const Bits oFound = MatchAt(pSamples + nAt * sizeof(T), nCount, nVector);
                       const auto oValid = (simd::Convert<std::uint8_t>(oFound) & std::uint8_t(1)) ^ std::uint8_t(1);
                       std::memcpy(pValid + nAt, &oValid, nCount);
                   });
    }

private:
    using Bits = typename Pattern<T>::Bits;
    using Samples = typename Pattern<T>::Samples;

    Bits MatchAt(const unsigned char* pSamples, std::size_t nCount, std::size_t nVector) const
    {
        if (nCount == Pattern<T>::LANES)
            return moPattern.Match(simd::Load<Samples>(pSamples), nVector);
        Samples oSamples{};
        std::memcpy(&oSamples, pSamples, nCount * sizeof(T));
        Bits oFound = moPattern.Match(oSamples, nVector);
        for (std::size_t n = nCount; n < Pattern<T>::LANES; ++n)
            oFound[n] = 0;
        return oFound;
    }

    Pattern<T> moPattern;
};

template <typename T>
class ValueFinisher : public IValueFinisher
{
public:
    explicit ValueFinisher(const std::vector<ChannelRule<T>>& oRules)
        : moPattern(oRules), mbChangesValid(HasValue(oRules))
    {
    }

    bool ChangesValid() const override { return mbChangesValid; }

    void Finish(unsigned char* pPixels, const unsigned char* pValid, std::size_t nSamples) const override
    {
        ForVectors(moPattern, nSamples,
                   [&](std::size_t nAt, std::size_t nCount, std::size_t nVector)
                   {
                       unsigned char* const pSamples = pPixels + nAt * sizeof(T);
                       Samples oSamples{};
                       Valid oValid{};
                       if (nCount == Pattern<T>::LANES)
                       {
                           std::memcpy(&oSamples, pSamples, sizeof oSamples);
                           if (pValid != nullptr)
                               std::memcpy(&oValid, pValid + nAt, sizeof oValid);
                       }
                       else
                       {
                           std::memcpy(&oSamples, pSamples, nCount * sizeof(T));
                           if (pValid != nullptr)
                               std::memcpy(&oValid, pValid + nAt, nCount);
                       }
                       const Bits oInvalid = pValid == nullptr
                                                 ? Bits{}
                                                 : reinterpret_cast<Bits>(simd::Convert<BitsOf<T>>(oValid) == Bits{});
                       const Samples oSettled = moPattern.Settle(oSamples, oInvalid, nVector);
                       if (nCount == Pattern<T>::LANES)
                           std::memcpy(pSamples, &oSettled, sizeof oSettled);
                       else
                           std::memcpy(pSamples, &oSettled, nCount * sizeof(T));
                   });
    }

private:
    using Bits = typename Pattern<T>::Bits;
    using Samples = typename Pattern<T>::Samples;
    using Valid = typename detail::VectorsOf<T>::Valid;

    Pattern<T> moPattern;
    bool mbChangesValid;
};

// The no-data value is that of the real part, the imaginary one is 0, or NaN with it.
template <typename T>
class ComplexFinisher : public IValueFinisher
{
public:
    explicit ComplexFinisher(std::vector<ChannelRule<T>> oRules) : moRules(std::move(oRules)) {}

    bool ChangesValid() const override { return HasValue(moRules); }

    void Finish(unsigned char* pPixels, const unsigned char* pValid, std::size_t nValues) const override
    {
        for (std::size_t n = 0; n < nValues; ++n, pPixels += 2 * sizeof(T))
            FinishValue(moRules[n % moRules.size()], pPixels, pValid == nullptr || pValid[n] != 0);
    }

private:
    static void FinishValue(const ChannelRule<T>& oRule, unsigned char* pValue, bool bValid)
    {
        T aValue[2] = {};
        std::memcpy(aValue, pValue, sizeof aValue);
        if (!bValid)
        {
            aValue[0] = oRule.mnValue;
            aValue[1] = oRule.mnValue != oRule.mnValue ? oRule.mnValue : T(0);
        }
        else if (oRule.mbNoData && aValue[0] == oRule.mnValue && aValue[1] == T(0))
            aValue[0] = Beside(aValue[0]);
        else
            return;
        std::memcpy(pValue, aValue, sizeof aValue);
    }

    std::vector<ChannelRule<T>> moRules;
};

} // namespace

ISampleTest::~ISampleTest() = default;

IValueFinisher::~IValueFinisher() = default;

std::unique_ptr<ISampleTest> MakeSampleTest(const DataType& oType, const NoDataNumbers& oNumbers, bool bNaNIsNoData)
{
    const auto Make = [&]<class T>(std::type_identity<T>) -> std::unique_ptr<ISampleTest>
    {
        const auto oRules = MakeRules<T>(oNumbers, bNaNIsNoData);
        const bool bAny = std::any_of(oRules.begin(), oRules.end(), [](const auto& oRule) { return oRule.mbNoData; });
        return bAny ? std::make_unique<SampleTest<T>>(oRules) : nullptr;
    };
    return VisitPartType(oType, Make);
}

std::unique_ptr<IValueFinisher> MakeValueFinisher(const DataType& oType, const NoDataNumbers& oNumbers,
                                                  bool bNaNIsNoData)
{
    const auto Make = [&]<class Value>(std::type_identity<Value>) -> std::unique_ptr<IValueFinisher>
    {
        using T = PartOf<Value>;
        auto oRules = MakeRules<T>(oNumbers, bNaNIsNoData);
        if constexpr (PARTS_OF<Value> == 2)
            return std::make_unique<ComplexFinisher<T>>(std::move(oRules));
        else
            return std::make_unique<ValueFinisher<T>>(oRules);
    };
    return VisitPixelType(oType, Make);
}

} // namespace krv::gobs
