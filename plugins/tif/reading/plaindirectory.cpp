#include "plugins/tif/reading/plaindirectory.h"

#include "plugins/tif/reading/compression.h"

#include <algorithm>
#include <iterator>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

enum class Count
{
    eOne,
    eSamples,
    eAny
};

struct Rule
{
    std::uint16_t mnTag;
    bool mbLong; // of 32 bits too, not of 16 alone
    Count meCount;
    std::uint64_t mnLeast;
    std::uint64_t mnMost;
};

constexpr Rule RULES[] = {
    {TIFFTAG_IMAGEWIDTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_IMAGELENGTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_BITSPERSAMPLE, false, Count::eSamples, 1, 128},
    {TIFFTAG_COMPRESSION, false, Count::eOne, 1, UINT16_MAX},
    {TIFFTAG_PHOTOMETRIC, false, Count::eOne, PHOTOMETRIC_MINISWHITE, PHOTOMETRIC_MASK},
    {TIFFTAG_FILLORDER, false, Count::eOne, FILLORDER_MSB2LSB, FILLORDER_MSB2LSB},
    {TIFFTAG_SAMPLESPERPIXEL, false, Count::eOne, 1, UINT16_MAX},
    {TIFFTAG_ROWSPERSTRIP, true, Count::eOne, 1, UINT32_MAX},
    {TIFFTAG_PLANARCONFIG, false, Count::eOne, PLANARCONFIG_CONTIG, PLANARCONFIG_SEPARATE},
    {TIFFTAG_PREDICTOR, false, Count::eOne, PREDICTOR_NONE, PREDICTOR_FLOATINGPOINT},
    {TIFFTAG_TILEWIDTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_TILELENGTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_EXTRASAMPLES, false, Count::eAny, EXTRASAMPLE_UNSPECIFIED, EXTRASAMPLE_UNASSALPHA},
    {TIFFTAG_SAMPLEFORMAT, false, Count::eSamples, SAMPLEFORMAT_UINT, SAMPLEFORMAT_COMPLEXIEEEFP},
};

// libtiff refuses a directory for unusual values of these, or takes them for others.
constexpr std::uint16_t ODD_TAGS[] = {TIFFTAG_MINSAMPLEVALUE,  TIFFTAG_MAXSAMPLEVALUE, TIFFTAG_SMINSAMPLEVALUE,
                                      TIFFTAG_SMAXSAMPLEVALUE, TIFFTAG_DATATYPE,       TIFFTAG_IMAGEDEPTH,
                                      TIFFTAG_TILEDEPTH};

constexpr std::uint16_t WANTED_TAGS[] = {TIFFTAG_IMAGEWIDTH, TIFFTAG_IMAGELENGTH, TIFFTAG_COMPRESSION,
                                         TIFFTAG_PHOTOMETRIC};

bool Fits(const RawDirectory& oDirectory, PeekReader& oReader, const DirectoryEntry& oEntry, std::uint64_t nChannels)
{
    if (std::find(std::begin(ODD_TAGS), std::end(ODD_TAGS), oEntry.mnTag) != std::end(ODD_TAGS))
        return false;
    const auto oRule = std::find_if(std::begin(RULES), std::end(RULES),
                                    [&oEntry](const Rule& oOne) { return oOne.mnTag == oEntry.mnTag; });
    if (oRule == std::end(RULES))
        return true;
    if (oEntry.mnType != TIFF_SHORT && !(oEntry.mnType == TIFF_LONG && oRule->mbLong))
        return false;
    if (oRule->meCount != Count::eAny && oEntry.mnCount != (oRule->meCount == Count::eOne ? 1 : nChannels))
        return false;
    const auto InRange = [&oRule](std::uint64_t nValue)
    {
        return nValue >= oRule->mnLeast && nValue <= oRule->mnMost;
    };
    if (oEntry.mnCount == 1)
        return InRange(oDirectory.GetNumber(oReader, oEntry.mnTag, UINT64_MAX));
    if (oEntry.mnCount > nChannels)
        return false;
    const auto oValues = oDirectory.GetNumbers(oReader, oEntry.mnTag, oEntry.mnCount);
    return oValues.size() == oEntry.mnCount && std::all_of(oValues.begin(), oValues.end(), InRange);
}

// libtiff counts channels without a colour as extra ones, and looks for the colours of a palette.
bool HasItsColours(const RawDirectory& oDirectory, PeekReader& oReader, std::uint64_t nChannels)
{
    const std::uint64_t nPhotometric = oDirectory.GetNumber(oReader, TIFFTAG_PHOTOMETRIC, 0);
    const DirectoryEntry* pExtra = oDirectory.Find(TIFFTAG_EXTRASAMPLES);
    const std::uint64_t nExtra = pExtra != nullptr ? pExtra->mnCount : 0;
    if (nChannels != nExtra + (nPhotometric == PHOTOMETRIC_RGB ? 3 : 1))
        return false;
    if (nPhotometric != PHOTOMETRIC_PALETTE)
        return true;
    const std::uint64_t nBits = oDirectory.GetNumber(oReader, TIFFTAG_BITSPERSAMPLE, 1);
    const DirectoryEntry* pColours = oDirectory.Find(TIFFTAG_COLORMAP);
    return pColours != nullptr && nBits <= 16 && pColours->mnType == TIFF_SHORT &&
           pColours->mnCount == std::uint64_t{3} << nBits &&
           pColours->mnOffset + pColours->GetBytes() <= oReader.GetFile().GetSize();
}

} // namespace

bool IsPlainDirectory(const RawDirectory& oDirectory, PeekReader& oReader)
{
    const auto& oEntries = oDirectory.GetEntries();
    const auto Has = [&oDirectory](std::uint16_t nTag)
    {
        return oDirectory.Find(nTag) != nullptr;
    };
    const bool bTiled = Has(TIFFTAG_TILEWIDTH);
    if (!std::all_of(std::begin(WANTED_TAGS), std::end(WANTED_TAGS), Has) || bTiled != Has(TIFFTAG_TILELENGTH) ||
        !Has(bTiled ? TIFFTAG_TILEOFFSETS : TIFFTAG_STRIPOFFSETS) ||
        !Has(bTiled ? TIFFTAG_TILEBYTECOUNTS : TIFFTAG_STRIPBYTECOUNTS))
        return false;
    const std::uint64_t nChannels = oDirectory.GetNumber(oReader, TIFFTAG_SAMPLESPERPIXEL, 1);
    for (std::size_t nAt = 0; nAt < oEntries.size(); ++nAt)
        if ((nAt > 0 && oEntries[nAt].mnTag <= oEntries[nAt - 1].mnTag) ||
            !Fits(oDirectory, oReader, oEntries[nAt], nChannels))
            return false;
    return IsOwnCompression(oDirectory.GetNumber(oReader, TIFFTAG_COMPRESSION, 0)) &&
           HasItsColours(oDirectory, oReader, nChannels);
}

} // namespace krv::plugins::tif
