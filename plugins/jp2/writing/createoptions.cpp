#include "plugins/jp2/writing/createoptions.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::plugins::jp2
{

namespace
{

constexpr std::uint32_t LARGEST_TILE = 16384;
constexpr std::uint32_t MOST_LEVELS = 30;
constexpr std::uint32_t MOST_BITS = 16;

support::Options MakeKeys(CreateOptions& oOptions)
{
    support::Options oKeys;
    oKeys.AddNumber("BLOCKXSIZE", oOptions.mnTileWidth, 1, LARGEST_TILE);
    oKeys.AddNumber("BLOCKYSIZE", oOptions.mnTileHeight, 1, LARGEST_TILE);
    oKeys.AddNumber("LEVELS", oOptions.moLevels, 0, MOST_LEVELS);
    oKeys.AddNumber("QUALITY", oOptions.moQuality, 10, 120);
    oKeys.AddNumber("RATIO", oOptions.moRatio, 2, 1000);
    oKeys.AddChoice("PROGRESSION", oOptions.mnProgression,
                    {{"LRCP", 0}, {"RLCP", 1}, {"RPCL", 2}, {"PCRL", 3}, {"CPRL", 4}});
    oKeys.AddChoice("COLORTRANSFORM", oOptions.moColourTransform, {{"YES", true}, {"NO", false}}, "AUTO");
    oKeys.AddNumber("NBITS", oOptions.mnSampleBits, 1, MOST_BITS);
    oKeys.AddChoice("BOXES", oOptions.moBoxes, {{"YES", true}, {"NO", false}}, "AUTO");
    return oKeys;
}

} // namespace

CreateOptions CreateOptions::Parse(const std::string& options, const Place& oPlace)
{
    CreateOptions oOptions;
    MakeKeys(oOptions).Parse(options, oPlace);
    if (oOptions.moQuality && oOptions.moRatio)
        throw DataException("The options QUALITY and RATIO do not go together", oPlace);
    return oOptions;
}

std::vector<support::Options::Description> CreateOptions::Describe()
{
    CreateOptions oOptions;
    return MakeKeys(oOptions).Describe();
}

} // namespace krv::plugins::jp2
