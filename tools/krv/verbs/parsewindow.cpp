#include "toolkit/core/numbertext.h"
#include "tools/krv/errors.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>

#include <cmath>
#include <string_view>

namespace krv::tool
{

std::vector<double> ParseReals(const std::string& text, const std::string& option, std::size_t nLeast,
                               std::size_t nMost)
{
    std::vector<double> oNumbers;
    std::string_view rest = text;
    while (!rest.empty() || (!oNumbers.empty() && text.back() == ','))
    {
        const std::size_t nComma = rest.find(',');
        const auto oNumber = krv::ParseNumber<double>(rest.substr(0, nComma));
        if (!oNumber || !std::isfinite(*oNumber))
            throw UsageError(option + ": \"" + text + "\" is no list of numbers such as 1.5,-20");
        oNumbers.push_back(*oNumber);
        if (nComma == std::string_view::npos)
            break;
        rest.remove_prefix(nComma + 1);
    }
    if (!text.empty() && (oNumbers.size() < nLeast || oNumbers.size() > nMost))
        throw UsageError(option + ": \"" + text + "\" has " + std::to_string(oNumbers.size()) + " numbers, not " +
                         std::to_string(nLeast) + (nMost > nLeast ? " to " + std::to_string(nMost) : std::string()));
    return oNumbers;
}

void AddWindowOptions(CLI::App& oVerb, WindowOptions& oOptions, const std::string& name, const std::string& what)
{
    auto* const poPixels = oVerb.add_option(name, oOptions.window, what + ": x,y,width,height in pixels");
    auto* const poBounds =
        oVerb.add_option("--bounds", oOptions.bounds, "The same in map coordinates: west,south,east,north");
    auto* const poLike = oVerb.add_option("--like", oOptions.like, "The same: where this file lies");
    poBounds->excludes(poPixels);
    poLike->excludes(poPixels)->excludes(poBounds);
}

krv::operations::WindowRequest ParseWindow(const WindowOptions& oOptions, const std::string& name)
{
    krv::operations::WindowRequest oRequest;
    const auto oPixels = ParseNumbers(oOptions.window, name);
    if (!oPixels.empty() && oPixels.size() != 4)
        throw UsageError(name + ": \"" + oOptions.window + "\" is not of the form x,y,width,height");
    if (!oPixels.empty())
        oRequest.pixels = krv::operations::PixelWindow{oPixels[0], oPixels[1], oPixels[2], oPixels[3]};
    const auto oBounds = ParseReals(oOptions.bounds, "--bounds", 4, 4);
    if (!oBounds.empty())
    {
        oRequest.bounds = krv::operations::MapBounds{oBounds[0], oBounds[1], oBounds[2], oBounds[3]};
        if (!(oBounds[0] < oBounds[2]) || !(oBounds[1] < oBounds[3]))
            throw UsageError("--bounds: \"" + oOptions.bounds + "\" is not west,south,east,north");
    }
    oRequest.like = oOptions.like;
    return oRequest;
}

} // namespace krv::tool
