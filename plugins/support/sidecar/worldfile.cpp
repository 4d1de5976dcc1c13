#include "plugins/support/sidecar/worldfile.h"

#include "toolkit/core/numbertext.h"

#include <array>
#include <cmath>
#include <filesystem>
#include <sstream>

namespace krv::plugins::support
{

std::optional<krv::ogc::cs::GeocodingInfo> ParseWorldFile(const std::string& text)
{
    std::istringstream oWords(text);
    std::array<double, 6> aNumbers{};
    for (double& nNumber : aNumbers)
    {
        std::string word;
        oWords >> word;
        const auto oNumber = krv::ParseNumber<double>(std::string_view(word).substr(word.starts_with('+') ? 1 : 0));
        if (!oNumber || !std::isfinite(*oNumber))
            return std::nullopt;
        nNumber = *oNumber;
    }
    const auto& [nXPerColumn, nYPerColumn, nXPerRow, nYPerRow, nX, nY] = aNumbers;
    const krv::ogc::cs::GeocodingInfo oInfo(nX - nXPerColumn / 2 - nXPerRow / 2, nXPerColumn, nXPerRow,
                                            nY - nYPerColumn / 2 - nYPerRow / 2, nYPerColumn, nYPerRow);
    return oInfo.IsInvertible() ? std::optional(oInfo) : std::nullopt;
}

std::vector<std::string> ListWorldEndings(const std::string& fileName)
{
    const std::string ending = std::filesystem::path(fileName).extension().string();
    std::vector<std::string> oEndings;
    if (ending.size() > 2)
        oEndings = {std::string{'.', ending[1], ending.back(), 'w'}, ending + "w"};
    oEndings.push_back(".wld");
    return oEndings;
}

} // namespace krv::plugins::support
