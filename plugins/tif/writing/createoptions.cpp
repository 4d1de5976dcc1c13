#include "plugins/tif/writing/createoptions.h"

#include "plugins/tif/reading/compression.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>
#include <vector>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint32_t LARGEST_BLOCK = 65536;
constexpr std::uint32_t LARGEST_SAMPLE_BITS = 64;
constexpr std::uint32_t LARGEST_LEVEL = 100;

std::vector<std::pair<std::string, std::uint16_t>> ListCompressions()
{
    std::vector<std::pair<std::string, std::uint16_t>> oChoices;
    for (const Compression& oOne : GetCompressions())
        if (oOne.mbWritten && FindCompression(oOne.moName) == &oOne)
            oChoices.emplace_back(oOne.moName, oOne.mnCode);
    return oChoices;
}

// The keys, whose values go to oOptions.
support::Options MakeKeys(CreateOptions& oOptions)
{
    using Choice = CreateOptions::Choice;
    support::Options oKeys;
    oKeys.AddFlag("TILED", oOptions.mbTiled);
    oKeys.AddNumber("BLOCKXSIZE", oOptions.mnBlockWidth, 1, LARGEST_BLOCK);
    oKeys.AddNumber("BLOCKYSIZE", oOptions.mnBlockHeight, 1, LARGEST_BLOCK);
    oKeys.AddChoice("INTERLEAVE", oOptions.mbSeparate, {{"PIXEL", false}, {"BAND", true}});
    oKeys.AddNumber("NBITS", oOptions.mnSampleBits, 1, LARGEST_SAMPLE_BITS);
    oKeys.AddChoice("BIGTIFF", oOptions.meBigTiff,
                    {{"AUTO", Choice::eAutomatic}, {"YES", Choice::eYes}, {"NO", Choice::eNo}});
    oKeys.AddChoice("LAYOUT", oOptions.mbCloud, {{"PLAIN", false}, {"COG", true}});
    oKeys.AddChoice("COMPRESS", oOptions.mnCompression, ListCompressions());
    oKeys.AddNumber("LEVEL", oOptions.moLevel, 1, LARGEST_LEVEL);
    oKeys.AddChoice("PREDICTOR", oOptions.mnPredictor,
                    {{"YES", 0}, {"NO", PREDICTOR_NONE}, {"1", PREDICTOR_NONE}, {"2", PREDICTOR_HORIZONTAL}, {"3", 3}});
    oKeys.AddChoice(
        "PHOTOMETRIC", oOptions.moPhotometric,
        {{"MINISBLACK", PHOTOMETRIC_MINISBLACK}, {"MINISWHITE", PHOTOMETRIC_MINISWHITE}, {"RGB", PHOTOMETRIC_RGB}},
        "AUTO");
    oKeys.AddChoice("ALPHA", oOptions.mnAlpha,
                    {{"NO", 0},
                     {"YES", EXTRASAMPLE_UNASSALPHA},
                     {"STRAIGHT", EXTRASAMPLE_UNASSALPHA},
                     {"PREMULTIPLIED", EXTRASAMPLE_ASSOCALPHA}});
    return oKeys;
}

void CheckTogether(const CreateOptions& oOptions, const support::Options& oKeys, const Place& oPlace)
{
    if (!oOptions.mbTiled && oKeys.IsGiven("BLOCKXSIZE"))
        throw DataException("The option BLOCKXSIZE is the width of tiles; it does not go with TILED=NO", oPlace);
    if (oOptions.mbCloud && !oOptions.mbTiled)
        throw DataException("The option LAYOUT=COG takes tiles; it does not go with TILED=NO", oPlace);
    if (oOptions.mbTiled && (oOptions.mnBlockWidth % 16 != 0 || oOptions.mnBlockHeight % 16 != 0))
        throw DataException("The sides of tiles (BLOCKXSIZE, BLOCKYSIZE) are multiples of 16", oPlace);
    const int nMost = FindCompression(oOptions.mnCompression)->mnMaximumLevel;
    if (oOptions.moLevel && *oOptions.moLevel > nMost)
        throw DataException(nMost == 0
                                ? "The option LEVEL does not go with this compression"
                                : "The option LEVEL takes at most " + std::to_string(nMost) + " with this compression",
                            oPlace);
}

} // namespace

CreateOptions CreateOptions::Parse(const std::string& options, const Place& oPlace)
{
    CreateOptions oOptions;
    support::Options oKeys = MakeKeys(oOptions);
    oKeys.Parse(options, oPlace);
    CheckTogether(oOptions, oKeys, oPlace);
    return oOptions;
}

std::vector<support::Options::Description> CreateOptions::Describe()
{
    CreateOptions oOptions;
    return MakeKeys(oOptions).Describe();
}

} // namespace krv::plugins::tif
