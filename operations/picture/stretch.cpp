#include "operations/picture/stretch.h"

#include <algorithm>
#include <cmath>

namespace krv::operations
{

namespace
{

// Rearranges the values. nShare: 0 is the smallest, 1 the largest.
float Quantile(std::vector<float>& oValues, double nShare)
{
    const auto nAt = static_cast<std::ptrdiff_t>(std::lround(nShare * static_cast<double>(oValues.size() - 1)));
    std::nth_element(oValues.begin(), oValues.begin() + nAt, oValues.end());
    return oValues[static_cast<std::size_t>(nAt)];
}

} // namespace

std::uint8_t Stretch::operator()(float nValue) const
{
    if (!(high > low))
        return 128;
    const float nLevel = (nValue - low) / (high - low) * 255.0F;
    return static_cast<std::uint8_t>(std::lround(std::clamp(nLevel, 0.0F, 255.0F)));
}

Stretch FindStretch(const Plane& oPlane, StretchMode eMode, bool bEightBit, bool bColour)
{
    if (eMode == StretchMode::eNone || (eMode == StretchMode::eAuto && bEightBit && bColour))
        return {};
    std::vector<float> oValues;
    for (std::size_t i = 0; i < oPlane.values.size(); ++i)
    {
        if (oPlane.coverage[i] > 0)
            oValues.push_back(oPlane.values[i]);
    }
    if (oValues.empty())
        return {};
    const Stretch oExtremes{Quantile(oValues, 0), Quantile(oValues, 1)};
    if (eMode == StretchMode::eMinMax)
        return oExtremes;
    const Stretch oPercentiles{Quantile(oValues, 0.02), Quantile(oValues, 0.98)};
    const bool bConstant = !(oExtremes.high > oExtremes.low);
    if (eMode == StretchMode::eAuto && bEightBit && (bConstant || oPercentiles.high - oPercentiles.low >= 127.0F))
        return {};
    return oPercentiles.high > oPercentiles.low ? oPercentiles : oExtremes;
}

std::vector<bool> FindCollar(const std::vector<Plane>& oPlanes)
{
    const std::size_t nWidth = oPlanes.front().width, nHeight = oPlanes.front().height;
    const auto IsDark = [&](std::size_t nAt)
    {
        return std::all_of(oPlanes.begin(), oPlanes.end(),
                           [nAt](const Plane& oPlane) { return oPlane.coverage[nAt] == 0 || oPlane.values[nAt] == 0; });
    };
    std::vector<bool> oCollar(nWidth * nHeight);
    std::vector<std::size_t> oFound;
    const auto Visit = [&](std::size_t nAt)
    {
        if (oCollar[nAt] || !IsDark(nAt))
            return;
        oCollar[nAt] = true;
        oFound.push_back(nAt);
    };
    for (std::size_t x = 0; x < nWidth; ++x)
    {
        Visit(x);
        Visit((nHeight - 1) * nWidth + x);
    }
    for (std::size_t y = 0; y < nHeight; ++y)
    {
        Visit(y * nWidth);
        Visit(y * nWidth + nWidth - 1);
    }
    for (std::size_t nNext = 0; nNext < oFound.size(); ++nNext)
    {
        const std::size_t nAt = oFound[nNext], x = nAt % nWidth, y = nAt / nWidth;
        if (x > 0)
            Visit(nAt - 1);
        if (x + 1 < nWidth)
            Visit(nAt + 1);
        if (y > 0)
            Visit(nAt - nWidth);
        if (y + 1 < nHeight)
            Visit(nAt + nWidth);
    }
    return oFound.size() * 100 < oCollar.size() ? std::vector<bool>() : oCollar;
}

} // namespace krv::operations
