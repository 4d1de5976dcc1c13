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

Stretch FindStretch(const Plane& oPlane, StretchMode eMode, bool bEightBit)
{
    if (eMode == StretchMode::eNone)
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
    if (eMode == StretchMode::eAuto && bEightBit && oPercentiles.high - oPercentiles.low >= 127.0F)
        return {};
    return oPercentiles.high > oPercentiles.low ? oPercentiles : oExtremes;
}

} // namespace krv::operations
