#include "plugins/tif/reading/sampleform.h"

#include "plugins/support/codec/bits.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

using krv::gobs::DataType;

constexpr unsigned int LONGEST_SAMPLE = 64;

DataType MakeType(unsigned int nBits, bool bSigned, bool bReal, bool bComplex)
{
    return DataType(nBits, bSigned, bReal, 0, 0, bComplex);
}

unsigned int NextWholeBits(unsigned int nBits)
{
    unsigned int nWhole = 8;
    while (nWhole < nBits)
        nWhole *= 2;
    return nWhole;
}

bool FindInteger(SampleForm& oForm, bool bSigned, bool bComplex)
{
    // The smallest complex integer has two parts of 16 bits.
    const unsigned int nBits =
        bComplex ? std::max(16u, NextWholeBits(oForm.mnPartBits)) : NextWholeBits(oForm.mnPartBits);
    if (nBits > (bComplex ? 32u : LONGEST_SAMPLE))
        return false;
    oForm.moType = MakeType(nBits, bSigned, false, bComplex);
    oForm.moNativeType = MakeType(oForm.mnPartBits, bSigned, false, bComplex);
    if (nBits == oForm.mnPartBits)
        oForm.meWidening = Widening::eNone;
    else
        oForm.meWidening = oForm.mnPartBits == 24 ? Widening::eThreeBytes : Widening::eBits;
    return true;
}

bool FindReal(SampleForm& oForm, bool bComplex)
{
    constexpr std::pair<unsigned int, Widening> REALS[] = {
        {16, Widening::eHalf}, {24, Widening::eFloat24}, {32, Widening::eNone}, {64, Widening::eNone}};
    const auto* const pFound = std::find_if(std::begin(REALS), std::end(REALS),
                                            [&](const auto& oReal) { return oReal.first == oForm.mnPartBits; });
    if (pFound == std::end(REALS))
        return false;
    oForm.meWidening = pFound->second;
    oForm.moType = MakeType(std::max(32u, oForm.mnPartBits), true, true, bComplex);
    oForm.moNativeType = MakeType(oForm.mnPartBits, true, true, bComplex);
    return true;
}

// Parts of up to 8 bits of a complex integer: by way of bytes to words of 16 bits.
void WidenSmallParts(const SampleForm& oForm, const unsigned char* pSource, unsigned char* pTarget, std::size_t nParts)
{
    const std::size_t nBytes = (nParts * oForm.mnPartBits + 7) / 8;
    unsigned char* pBytes = pTarget + nParts;
    codec::UnpackBits(pSource, nBytes, nBytes, pBytes, nParts, nParts, 1, oForm.mnPartBits, oForm.IsSigned());
    for (std::size_t nAt = 0; nAt < nParts; ++nAt)
    {
        const auto nValue = oForm.IsSigned() ? static_cast<std::int16_t>(static_cast<signed char>(pBytes[nAt]))
                                             : static_cast<std::int16_t>(pBytes[nAt]);
        std::memcpy(pTarget + 2 * nAt, &nValue, sizeof(nValue));
    }
}

void WidenRow(const SampleForm& oForm, const unsigned char* pSource, unsigned char* pTarget, std::size_t nParts)
{
    switch (oForm.meWidening)
    {
    case Widening::eNone:
        break;
    case Widening::eBits:
        return WidenSmallParts(oForm, pSource, pTarget, nParts);
    case Widening::eThreeBytes:
        return codec::Unpack24(pSource, pTarget, nParts, false, oForm.IsSigned());
    case Widening::eHalf:
        return codec::HalfToFloat(pSource, pTarget, nParts);
    case Widening::eFloat24:
        return codec::Float24ToFloat(pSource, pTarget, nParts);
    }
}

} // namespace

bool FindSampleForm(unsigned int nBits, unsigned int nFormat, SampleForm& oForm, std::string& reason)
{
    const bool bComplex = nFormat == SAMPLEFORMAT_COMPLEXINT || nFormat == SAMPLEFORMAT_COMPLEXIEEEFP;
    oForm.mnParts = bComplex ? 2 : 1;
    oForm.mnPartBits = nBits / oForm.mnParts;
    const bool bReal = nFormat == SAMPLEFORMAT_IEEEFP || nFormat == SAMPLEFORMAT_COMPLEXIEEEFP;
    const bool bSigned = nFormat == SAMPLEFORMAT_INT || nFormat == SAMPLEFORMAT_COMPLEXINT;
    const bool bFound = nBits > 0 && nBits % oForm.mnParts == 0 && nFormat >= SAMPLEFORMAT_UINT &&
                        nFormat <= SAMPLEFORMAT_COMPLEXIEEEFP &&
                        (bReal ? FindReal(oForm, bComplex) : FindInteger(oForm, bSigned, bComplex));
    if (!bFound)
        reason = "samples of " + std::to_string(nBits) + " bits in sample format " + std::to_string(nFormat) +
                 " cannot be read";
    return bFound;
}

void WidenRows(const SampleForm& oForm, const unsigned char* pSource, std::size_t nSourcePitch, unsigned char* pTarget,
               std::size_t nTargetPitch, std::size_t nCount, std::size_t nRows)
{
    if (nRows == 0)
        return;
    const std::size_t nParts = nCount * oForm.mnParts;
    const std::size_t nBytes = (nRows - 1) * nSourcePitch + (nParts * oForm.mnPartBits + 7) / 8;
    if (oForm.meWidening == Widening::eBits && codec::GetContainerBytes(oForm.mnPartBits) == oForm.GetPartBytes())
        return codec::UnpackBits(pSource, nBytes, nSourcePitch, pTarget, nTargetPitch, nParts, nRows, oForm.mnPartBits,
                                 oForm.IsSigned());
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        WidenRow(oForm, pSource + nRow * nSourcePitch, pTarget + nRow * nTargetPitch, nParts);
}

} // namespace krv::plugins::tif
