#include "plugins/tif/writing/createoptions.h"

#include "plugins/support/codec/deflateencoder.h"
#include "plugins/support/codec/zstdencoder.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <set>
#include <sstream>
#include <utility>
#include <vector>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

std::string Upper(std::string text)
{
    std::transform(text.begin(), text.end(), text.begin(), [](unsigned char n) { return std::toupper(n); });
    return text;
}

[[noreturn]] void Fail(const std::string& key, const std::string& value, const std::string& allowed,
                       const Place& oPlace)
{
    throw DataException("The option " + key + "=" + value + " is not known; it takes " + allowed, oPlace);
}

struct Setting
{
    std::string moKey;
    std::string moValue;
    const Place& moPlace;

    template <typename T>
    T Choose(const std::vector<std::pair<const char*, T>>& oChoices) const
    {
        std::string allowed;
        for (const auto& [pName, nValue] : oChoices)
        {
            if (moValue == pName)
                return nValue;
            allowed += (allowed.empty() ? "" : ", ") + std::string(pName);
        }
        Fail(moKey, moValue, allowed, moPlace);
    }

    std::uint32_t Number(std::uint32_t nFrom, std::uint32_t nTo) const
    {
        std::uint32_t nValue = 0;
        const char* pEnd = moValue.data() + moValue.size();
        const auto oResult = std::from_chars(moValue.data(), pEnd, nValue);
        if (oResult.ec != std::errc() || oResult.ptr != pEnd || nValue < nFrom || nValue > nTo)
            Fail(moKey, moValue, "a number from " + std::to_string(nFrom) + " to " + std::to_string(nTo), moPlace);
        return nValue;
    }
};

constexpr std::uint32_t LARGEST_BLOCK = 65536;
constexpr std::uint32_t LARGEST_SAMPLE_BITS = 64;

bool ApplyLayout(const Setting& oSetting, CreateOptions& oOptions)
{
    using Choice = CreateOptions::Choice;
    if (oSetting.moKey == "TILED")
        oOptions.mbTiled = oSetting.Choose<bool>({{"YES", true}, {"NO", false}});
    else if (oSetting.moKey == "BLOCKXSIZE")
        oOptions.mnBlockWidth = oSetting.Number(1, LARGEST_BLOCK);
    else if (oSetting.moKey == "BLOCKYSIZE")
        oOptions.mnBlockHeight = oSetting.Number(1, LARGEST_BLOCK);
    else if (oSetting.moKey == "INTERLEAVE")
        oOptions.mbSeparate = oSetting.Choose<bool>({{"PIXEL", false}, {"BAND", true}});
    else if (oSetting.moKey == "NBITS")
        oOptions.mnSampleBits = oSetting.Number(1, LARGEST_SAMPLE_BITS);
    else if (oSetting.moKey == "BIGTIFF")
        oOptions.meBigTiff =
            oSetting.Choose<Choice>({{"AUTO", Choice::eAutomatic}, {"YES", Choice::eYes}, {"NO", Choice::eNo}});
    else if (oSetting.moKey == "LAYOUT")
        oOptions.mbCloud = oSetting.Choose<bool>({{"PLAIN", false}, {"COG", true}});
    else
        return false;
    return true;
}

bool ApplyCoding(const Setting& oSetting, CreateOptions& oOptions)
{
    using Code = std::uint16_t;
    if (oSetting.moKey == "COMPRESS")
        oOptions.mnCompression = oSetting.Choose<Code>({{"NONE", COMPRESSION_NONE},
                                                        {"DEFLATE", COMPRESSION_ADOBE_DEFLATE},
                                                        {"LZW", COMPRESSION_LZW},
                                                        {"ZSTD", COMPRESSION_ZSTD},
                                                        {"PACKBITS", COMPRESSION_PACKBITS},
                                                        {"LZMA", COMPRESSION_LZMA},
                                                        {"JPEG", COMPRESSION_JPEG}});
    else if (oSetting.moKey == "LEVEL")
        oOptions.moLevel = static_cast<int>(oSetting.Number(1, 100));
    else if (oSetting.moKey == "PREDICTOR")
        oOptions.mnPredictor = oSetting.Choose<Code>(
            {{"YES", 0}, {"NO", PREDICTOR_NONE}, {"1", PREDICTOR_NONE}, {"2", PREDICTOR_HORIZONTAL}, {"3", 3}});
    else
        return false;
    return true;
}

bool ApplyMeaning(const Setting& oSetting, CreateOptions& oOptions)
{
    using Code = std::uint16_t;
    if (oSetting.moKey == "PHOTOMETRIC" && oSetting.moValue == "AUTO")
        oOptions.moPhotometric.reset();
    else if (oSetting.moKey == "PHOTOMETRIC")
        oOptions.moPhotometric = oSetting.Choose<Code>(
            {{"MINISBLACK", PHOTOMETRIC_MINISBLACK}, {"MINISWHITE", PHOTOMETRIC_MINISWHITE}, {"RGB", PHOTOMETRIC_RGB}});
    else if (oSetting.moKey == "ALPHA")
        oOptions.mnAlpha = oSetting.Choose<Code>({{"NO", 0},
                                                  {"YES", EXTRASAMPLE_UNASSALPHA},
                                                  {"STRAIGHT", EXTRASAMPLE_UNASSALPHA},
                                                  {"PREMULTIPLIED", EXTRASAMPLE_ASSOCALPHA}});
    else
        return false;
    return true;
}

void CheckTogether(const CreateOptions& oOptions, const std::set<std::string>& oKeys, const Place& oPlace)
{
    if (!oOptions.mbTiled && oKeys.contains("BLOCKXSIZE"))
        throw DataException("The option BLOCKXSIZE is the width of tiles; it does not go with TILED=NO", oPlace);
    if (oOptions.mbCloud && !oOptions.mbTiled)
        throw DataException("The option LAYOUT=COG takes tiles; it does not go with TILED=NO", oPlace);
    if (oOptions.mbTiled && (oOptions.mnBlockWidth % 16 != 0 || oOptions.mnBlockHeight % 16 != 0))
        throw DataException("The sides of tiles (BLOCKXSIZE, BLOCKYSIZE) are multiples of 16", oPlace);
    if (!oOptions.moLevel)
        return;
    const int nMost = oOptions.mnCompression == COMPRESSION_ADOBE_DEFLATE ? codec::DeflateEncoder::MAXIMUM_LEVEL
                      : oOptions.mnCompression == COMPRESSION_ZSTD        ? codec::ZstdEncoder::MAXIMUM_LEVEL
                      : oOptions.mnCompression == COMPRESSION_LZMA        ? 9
                      : oOptions.mnCompression == COMPRESSION_JPEG        ? 100
                                                                          : 0;
    if (*oOptions.moLevel > nMost)
        throw DataException(nMost == 0
                                ? "The option LEVEL does not go with this compression"
                                : "The option LEVEL takes at most " + std::to_string(nMost) + " with this compression",
                            oPlace);
}

} // namespace

bool HasPredictor(std::uint16_t nCompression)
{
    return nCompression == COMPRESSION_LZW || nCompression == COMPRESSION_DEFLATE ||
           nCompression == COMPRESSION_ADOBE_DEFLATE || nCompression == COMPRESSION_ZSTD ||
           nCompression == COMPRESSION_LZMA;
}

CreateOptions CreateOptions::Parse(const std::string& options, const Place& oPlace)
{
    CreateOptions oOptions;
    std::istringstream oWords(options);
    std::set<std::string> oKeys;
    for (std::string word; oWords >> word;)
    {
        const std::size_t nSign = word.find('=');
        if (nSign == std::string::npos)
            throw DataException("The option \"" + word + "\" is not of the form KEY=VALUE", oPlace);
        const Setting oSetting{Upper(word.substr(0, nSign)), Upper(word.substr(nSign + 1)), oPlace};
        if (!ApplyLayout(oSetting, oOptions) && !ApplyCoding(oSetting, oOptions) && !ApplyMeaning(oSetting, oOptions))
            throw DataException("The option " + oSetting.moKey + " is not known", oPlace);
        if (!oKeys.insert(oSetting.moKey).second)
            throw DataException("The option " + oSetting.moKey + " is given twice", oPlace);
    }
    CheckTogether(oOptions, oKeys, oPlace);
    return oOptions;
}

} // namespace krv::plugins::tif
