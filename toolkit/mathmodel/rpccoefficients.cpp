#include "toolkit/mathmodel/rpccoefficients.h"

#include "toolkit/core/numbertext.h"

#include <algorithm>
#include <cmath>

namespace krv::mathmodel
{

namespace
{

constexpr double RpcCoefficients::*NUMBERS[] = {
    &RpcCoefficients::biasError,     &RpcCoefficients::randomError,    &RpcCoefficients::lineOffset,
    &RpcCoefficients::sampleOffset,  &RpcCoefficients::latitudeOffset, &RpcCoefficients::longitudeOffset,
    &RpcCoefficients::heightOffset,  &RpcCoefficients::lineScale,      &RpcCoefficients::sampleScale,
    &RpcCoefficients::latitudeScale, &RpcCoefficients::longitudeScale, &RpcCoefficients::heightScale};
constexpr RpcCoefficients::Polynomial RpcCoefficients::*POLYNOMIALS[] = {
    &RpcCoefficients::lineNumerator, &RpcCoefficients::lineDenominator, &RpcCoefficients::sampleNumerator,
    &RpcCoefficients::sampleDenominator};

// The centre of the first pixel is 0 in the model and 0.5 in the image.
double ScaledOffset(double nOffset, double nRatio)
{
    return (nOffset + 0.5) / nRatio - 0.5;
}

} // namespace

RpcCoefficients::Values RpcCoefficients::GetValues() const
{
    Values oValues{};
    auto pNext = oValues.begin();
    for (const auto pNumber : NUMBERS)
        *pNext++ = this->*pNumber;
    for (const auto pPolynomial : POLYNOMIALS)
        pNext = std::copy((this->*pPolynomial).begin(), (this->*pPolynomial).end(), pNext);
    return oValues;
}

RpcCoefficients RpcCoefficients::FromValues(const Values& oValues)
{
    RpcCoefficients oResult;
    auto pNext = oValues.begin();
    for (const auto pNumber : NUMBERS)
        oResult.*pNumber = *pNext++;
    for (const auto pPolynomial : POLYNOMIALS)
    {
        std::copy_n(pNext, (oResult.*pPolynomial).size(), (oResult.*pPolynomial).begin());
        pNext += static_cast<std::ptrdiff_t>((oResult.*pPolynomial).size());
    }
    return oResult;
}

std::string RpcCoefficients::GetText() const
{
    std::string text;
    for (const double nValue : GetValues())
        text += (text.empty() ? "" : " ") + NumberText(nValue);
    return text;
}

std::optional<RpcCoefficients> RpcCoefficients::FromText(std::string_view text)
{
    constexpr std::string_view BLANKS = " \t\r\n";
    Values oValues{};
    for (double& nValue : oValues)
    {
        text.remove_prefix(std::min(text.find_first_not_of(BLANKS), text.size()));
        const std::string_view word = text.substr(0, text.find_first_of(BLANKS));
        const std::optional<double> oNumber = ParseNumber<double>(word);
        if (!oNumber)
            return std::nullopt;
        nValue = *oNumber;
        text.remove_prefix(word.size());
    }
    return text.find_first_not_of(BLANKS) == text.npos ? std::optional(FromValues(oValues)) : std::nullopt;
}

RpcCoefficients RpcCoefficients::Shifted(double nColumn, double nRow) const
{
    RpcCoefficients oResult = *this;
    oResult.sampleOffset -= nColumn;
    oResult.lineOffset -= nRow;
    return oResult;
}

RpcCoefficients RpcCoefficients::Scaled(double nColumnRatio, double nRowRatio) const
{
    RpcCoefficients oResult = *this;
    oResult.sampleOffset = ScaledOffset(sampleOffset, nColumnRatio);
    oResult.sampleScale = sampleScale / nColumnRatio;
    oResult.lineOffset = ScaledOffset(lineOffset, nRowRatio);
    oResult.lineScale = lineScale / nRowRatio;
    return oResult;
}

std::string RpcCoefficients::FindFault() const
{
    const Values oValues = GetValues();
    if (!std::all_of(oValues.begin(), oValues.end(), [](double nValue) { return std::isfinite(nValue); }))
        return "a coefficient is no finite number";
    constexpr std::pair<double RpcCoefficients::*, const char*> SCALES[] = {
        {&RpcCoefficients::lineScale, "line"},
        {&RpcCoefficients::sampleScale, "sample"},
        {&RpcCoefficients::latitudeScale, "latitude"},
        {&RpcCoefficients::longitudeScale, "longitude"},
        {&RpcCoefficients::heightScale, "height"}};
    for (const auto& [pScale, pName] : SCALES)
        if (this->*pScale == 0)
            return std::string("the scale of the ") + pName + " is zero";
    if (lineDenominator.front() == 0 || sampleDenominator.front() == 0)
        return "a denominator is zero at the centre";
    return {};
}

} // namespace krv::mathmodel
