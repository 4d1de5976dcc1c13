#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <vector>

// Conversion between pixel types by its rules alone, to compare the library with.
namespace krv::test
{

// The model works value by value in long double, whose 64 bits of fraction hold every part type exactly, and knows
// nothing of the types but these facts.
struct Part
{
    int mnBytes;
    bool mbReal;
    long double mnLow;
    long double mnHigh;
    long double (*Load)(const unsigned char*);
    void (*Store)(unsigned char*, long double);
};

template <typename T>
Part PartOf()
{
    static_assert(std::numeric_limits<long double>::digits >= 64);
    using Limits = std::numeric_limits<T>;
    return {sizeof(T),
            !Limits::is_integer,
            static_cast<long double>(Limits::lowest()),
            static_cast<long double>(Limits::max()),
            [](const unsigned char* p)
            {
                T nValue;
                std::memcpy(&nValue, p, sizeof(T));
                return static_cast<long double>(nValue);
            },
            [](unsigned char* p, long double nValue)
            {
                const T nStored = static_cast<T>(nValue);
                std::memcpy(p, &nStored, sizeof(T));
            }};
}

inline const Part PARTS[] = {PartOf<std::uint8_t>(), PartOf<std::int8_t>(),   PartOf<std::uint16_t>(),
                             PartOf<std::int16_t>(), PartOf<std::uint32_t>(), PartOf<std::int32_t>(),
                             PartOf<float>(),        PartOf<std::uint64_t>(), PartOf<std::int64_t>(),
                             PartOf<double>()};

// By the number of a buffer type or of a native data type, which are the same.
struct Type
{
    const Part* mpoPart;
    int mnParts;

    explicit Type(int nType)
    {
        constexpr int COMPLEX[] = {2, 3, 5, 6, 9};
        mpoPart = &PARTS[nType < 10 ? nType : COMPLEX[nType - 10]];
        mnParts = nType < 10 ? 1 : 2;
    }
    std::size_t Bytes() const { return static_cast<std::size_t>(mpoPart->mnBytes * mnParts); }
};

inline long double ModelPart(long double nValue, const Part& oTarget)
{
    if (oTarget.mbReal)
        return nValue;
    if (std::isnan(nValue))
        return 0;
    const long double nLower = std::floor(nValue);
    const long double nRest = nValue - nLower;
    const bool bUp = nRest > 0.5L || (nRest == 0.5L && std::fmod(nLower, 2.0L) != 0);
    return std::min(std::max(bUp ? nLower + 1 : nLower, oTarget.mnLow), oTarget.mnHigh);
}

inline void ModelValue(const unsigned char* pSource, const Type& oSource, unsigned char* pTarget, const Type& oTarget)
{
    for (int nPart = 0; nPart < oTarget.mnParts; ++nPart)
    {
        const long double nValue =
            nPart < oSource.mnParts ? oSource.mpoPart->Load(pSource + nPart * oSource.mpoPart->mnBytes) : 0;
        oTarget.mpoPart->Store(pTarget + nPart * oTarget.mpoPart->mnBytes, ModelPart(nValue, *oTarget.mpoPart));
    }
}

// Values of a part type: what only reals know (early, where vector code meets it), every limit of every type with its
// neighbours, and halves, as far as the type holds them.
inline std::vector<unsigned char> BoundaryValues(const Part& oPart)
{
    std::vector<long double> oValues = {0, 0.25L, 0.49999997L, 123456.5L, 1e30L, 3000000000.5L + 1e-6L};
    for (const long double nHalf : {0.5L, 1.5L, 2.5L})
        for (const long double nStep : {0.0L, 1e-10L, -1e-10L})
            oValues.insert(oValues.end(), {nHalf + nStep, -nHalf - nStep});
    for (const Part& oOther : PARTS)
        for (long double nLimit : {oOther.mnLow, oOther.mnHigh})
            for (long double nStep : {-1.0L, -0.5L, 0.0L, 0.5L, 1.0L, 1.5L})
                oValues.push_back(nLimit + nStep);
    for (int nBits : {23, 24, 31, 32, 52, 53, 62, 63})
        for (int nStep = -3; nStep <= 3; ++nStep)
            for (int nSign : {-1, 1})
                oValues.push_back(nSign * (std::ldexp(1.0L, nBits) + nStep));
    if (oPart.mbReal)
        for (long double nValue : {std::numeric_limits<long double>::infinity(),
                                   -std::numeric_limits<long double>::infinity(), std::nanl("")})
            oValues.insert(oValues.begin() + 3, nValue);
    std::vector<unsigned char> oBytes(oValues.size() * static_cast<std::size_t>(oPart.mnBytes));
    for (std::size_t i = 0; i < oValues.size(); ++i)
        oPart.Store(oBytes.data() + i * static_cast<std::size_t>(oPart.mnBytes), ModelPart(oValues[i], oPart));
    return oBytes;
}

inline bool Same(const unsigned char* pLeft, const unsigned char* pRight, const Part& oPart)
{
    if (oPart.mbReal && std::isnan(oPart.Load(pLeft)))
        return std::isnan(oPart.Load(pRight));
    return std::memcmp(pLeft, pRight, static_cast<std::size_t>(oPart.mnBytes)) == 0;
}

} // namespace krv::test
