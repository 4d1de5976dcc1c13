#include "plugins/krvdsk/createoptions.h"

#include "plugins/support/codec/blockcodec.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::plugins::krvdsk
{

namespace
{

constexpr std::uint32_t LARGEST_LEVEL = 22;
constexpr std::uint32_t LARGEST_SAMPLE_BITS = 64;
constexpr std::string_view LINK_KEY = "FILENOCREATE=";

// The keys, whose values go to oDefaults.
support::Options MakeKeys(Catalogue& oDefaults)
{
    support::Options oKeys;
    std::vector<std::pair<std::string, Coding>> oCodings;
    for (const Coding eCoding : {Coding::eNone, Coding::eDeflate, Coding::eZstd, Coding::eLz4, Coding::eLzw})
        oCodings.emplace_back(GetCodingName(eCoding), eCoding);
    oKeys.AddChoice("COMPRESS", oDefaults.meCoding, oCodings);
    oKeys.AddNumber("LEVEL", oDefaults.mnCodingLevel, 1, LARGEST_LEVEL);
    oKeys.AddChoice("PREDICTOR", oDefaults.mnPredictor, {{"YES", 0}, {"NO", 1}, {"1", 1}, {"2", 2}, {"3", 3}});
    oKeys.AddNumber("BLOCKXSIZE", oDefaults.mnBlockWidth, 1, Catalogue::LARGEST_BLOCK_SIDE);
    oKeys.AddNumber("BLOCKYSIZE", oDefaults.mnBlockHeight, 1, Catalogue::LARGEST_BLOCK_SIDE);
    oKeys.AddChoice("INTERLEAVE", oDefaults.mbSeparate, {{"PIXEL", false}, {"BAND", true}});
    oKeys.AddNumber("NBITS", oDefaults.mnKeptBits, 1, LARGEST_SAMPLE_BITS);
    return oKeys;
}

// Where the key of a link begins, as a word of its own; npos when there is none.
std::size_t FindLink(const std::string& options)
{
    const std::string upper = krv::ToUpper(options);
    std::size_t nAt = upper.find(LINK_KEY);
    while (nAt != std::string::npos && nAt != 0 && upper[nAt - 1] != ' ' && upper[nAt - 1] != '\t')
        nAt = upper.find(LINK_KEY, nAt + 1);
    return nAt;
}

} // namespace

CreateOptions CreateOptions::Parse(const std::string& options, const Place& oPlace)
{
    CreateOptions oOptions;
    const std::size_t nLink = FindLink(options);
    if (nLink != std::string::npos)
        oOptions.moLinked = options.substr(nLink + LINK_KEY.size());
    support::Options oKeys = MakeKeys(oOptions.moDefaults);
    oKeys.Parse(options.substr(0, nLink), oPlace);
    if (oOptions.moLinked && oKeys.IsGiven("NBITS"))
        throw DataException("The option NBITS does not go with a link: the values are those of the other file", oPlace);
    const codec::BlockCodec* const pCodec = codec::FindBlockCodec(GetCodingName(oOptions.moDefaults.meCoding));
    const int nMost = pCodec == nullptr ? 0 : pCodec->mnMaximumLevel;
    if (oOptions.moDefaults.mnCodingLevel > nMost)
        throw DataException(nMost == 0
                                ? "The option LEVEL does not go with this compression"
                                : "The option LEVEL takes at most " + std::to_string(nMost) + " with this compression",
                            oPlace);
    return oOptions;
}

std::vector<support::Options::Description> CreateOptions::Describe()
{
    Catalogue oDefaults;
    std::vector<support::Options::Description> oKeys = MakeKeys(oDefaults).Describe();
    oKeys.push_back({"FILENOCREATE", "the name of another file, to the end of the options"});
    return oKeys;
}

} // namespace krv::plugins::krvdsk
