#include "plugins/tif/reading/tiffvalues.h"

#include <cstring>
#include <span>

namespace krv::plugins::tif
{

namespace
{

// The values of a tag that has a count; how it is handed out depends on who made the tag known.
template <class Value>
std::span<const Value> Fetch(TIFF* poTiff, const TIFFField* poField)
{
    std::uint32_t nLong = 0;
    std::uint16_t nShort = 0;
    const Value* pValues = nullptr;
    const std::uint32_t nTag = TIFFFieldTag(poField);
    const bool bLong = TIFFFieldReadCount(poField) == TIFF_VARIABLE2;
    const int nFound =
        bLong ? TIFFGetField(poTiff, nTag, &nLong, &pValues) : TIFFGetField(poTiff, nTag, &nShort, &pValues);
    if (nFound != 1 || pValues == nullptr)
        return {};
    return {pValues, bLong ? nLong : nShort};
}

template <class Value>
std::vector<Value> ReadValues(TIFF* poTiff, std::uint32_t nTag, TIFFDataType eType)
{
    const TIFFField* const poField = TIFFFindField(poTiff, nTag, TIFF_ANY);
    if (poField == nullptr || TIFFFieldDataType(poField) != eType || TIFFFieldPassCount(poField) == 0)
        return {};
    const auto oValues = Fetch<Value>(poTiff, poField);
    return std::vector<Value>(oValues.begin(), oValues.end());
}

} // namespace

std::vector<double> ReadDoubles(TIFF* poTiff, std::uint32_t nTag)
{
    return ReadValues<double>(poTiff, nTag, TIFF_DOUBLE);
}

std::vector<std::uint16_t> ReadShorts(TIFF* poTiff, std::uint32_t nTag)
{
    return ReadValues<std::uint16_t>(poTiff, nTag, TIFF_SHORT);
}

std::string ReadText(TIFF* poTiff, std::uint32_t nTag)
{
    const TIFFField* const poField = TIFFFindField(poTiff, nTag, TIFF_ANY);
    if (poField == nullptr)
        return {};
    // A number: for a tag that libtiff does not know it is what the file says, any 16 bits.
    const int nType = static_cast<int>(TIFFFieldDataType(poField));
    if (nType != TIFF_ASCII && nType != TIFF_BYTE && nType != TIFF_UNDEFINED)
        return {};
    const char* pText = nullptr;
    if (TIFFFieldPassCount(poField) == 0)
        return TIFFGetField(poTiff, nTag, &pText) == 1 && pText != nullptr ? std::string(pText) : std::string();
    const auto oText = Fetch<char>(poTiff, poField);
    return std::string(oText.data(), oText.empty() ? 0 : strnlen(oText.data(), oText.size()));
}

} // namespace krv::plugins::tif
