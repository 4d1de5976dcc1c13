#include "plugins/raw/rawform.h"

#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <bit>
#include <climits>
#include <cmath>
#include <utility>

namespace krv::plugins::raw
{

namespace
{

constexpr std::pair<int, krv::gobs::NativeDataTypeCode> TYPES[] = {
    {1, krv::gobs::eDT_8U},   {2, krv::gobs::eDT_16S},  {3, krv::gobs::eDT_32S},  {4, krv::gobs::eDT_32R},
    {5, krv::gobs::eDT_64R},  {6, krv::gobs::eDT_C32R}, {9, krv::gobs::eDT_C64R}, {12, krv::gobs::eDT_16U},
    {13, krv::gobs::eDT_32U}, {14, krv::gobs::eDT_64S}, {15, krv::gobs::eDT_64U}};

constexpr std::pair<const char*, Interleave> INTERLEAVES[] = {
    {"bsq", Interleave::eBand}, {"bil", Interleave::eLine}, {"bip", Interleave::ePixel}};

constexpr const char* FORM_KEYS[] = {"samples",   "lines",      "bands",     "header offset",
                                     "data type", "interleave", "byte order"};

[[noreturn]] void Refuse(const std::string& name, const std::string& key, const std::string& value,
                         const std::string& takes)
{
    throw FileFormatException(name, name + ": \"" + key + " = " + value + "\" is not " + takes);
}

std::uint64_t ReadNumber(const HeaderText& oHeader, const std::string& name, const char* pKey, std::uint64_t nUsual,
                         std::uint64_t nFrom, std::uint64_t nTo)
{
    const auto oValue = oHeader.Find(pKey);
    if (!oValue)
        return nUsual;
    const auto oNumber = krv::ParseNumber<std::uint64_t>(oHeader.GetText(pKey));
    if (!oNumber || *oNumber < nFrom || *oNumber > nTo)
        Refuse(name, pKey, *oValue, "a number from " + std::to_string(nFrom) + " to " + std::to_string(nTo));
    return *oNumber;
}

void CheckPresent(const HeaderText& oHeader, const std::string& name)
{
    for (const char* const pKey : {"samples", "lines", "data type"})
        if (!oHeader.Find(pKey))
            throw FileFormatException(name, name + ": the header has no \"" + pKey + "\"");
    const std::string kind = HeaderText::Normalise(oHeader.GetText("file type"));
    if (!kind.empty() && !kind.starts_with("envi"))
        Refuse(name, "file type", kind, "a kind whose pixels lie plain in the file");
    if (const std::string coded = oHeader.GetText("file compression"); !coded.empty() && coded != "0")
        Refuse(name, "file compression", coded, "0: compressed files cannot be read");
}

} // namespace

std::optional<krv::gobs::DataType> FindType(int nCode)
{
    for (const auto& [nOne, eType] : TYPES)
        if (nOne == nCode)
            return krv::gobs::DataType(eType);
    return std::nullopt;
}

int FindTypeCode(const krv::gobs::DataType& oType)
{
    for (const auto& [nOne, eType] : TYPES)
        if (krv::gobs::DataType(eType) == oType)
            return nOne;
    return 0;
}

std::optional<double> ParseReal(const std::string& text)
{
    const auto oNumber = krv::ParseNumber<double>(std::string_view(text).substr(text.starts_with('+') ? 1 : 0));
    return oNumber && std::isfinite(*oNumber) ? oNumber : std::nullopt;
}

RawForm ReadForm(const HeaderText& oHeader, const std::string& name)
{
    CheckPresent(oHeader, name);
    for (const char* const pKey : FORM_KEYS)
        if (oHeader.IsContradicted(pKey))
            throw FileFormatException(name, name + ": \"" + pKey + "\" stands there twice, with different values");
    RawForm oForm;
    oForm.mnWidth = static_cast<unsigned int>(ReadNumber(oHeader, name, "samples", 0, 1, INT_MAX));
    oForm.mnHeight = static_cast<unsigned int>(ReadNumber(oHeader, name, "lines", 0, 1, INT_MAX));
    oForm.mnChannels = static_cast<unsigned int>(ReadNumber(oHeader, name, "bands", 1, 1, RawForm::MOST_CHANNELS));
    oForm.mnOffset = ReadNumber(oHeader, name, "header offset", 0, 0, INT64_MAX);
    oForm.mbBigEndian = ReadNumber(oHeader, name, "byte order", 0, 0, 1) == 1;
    const auto oType = FindType(static_cast<int>(ReadNumber(oHeader, name, "data type", 0, 0, INT_MAX)));
    if (!oType)
        Refuse(name, "data type", oHeader.GetText("data type"), "one of 1, 2, 3, 4, 5, 6, 9, 12, 13, 14, 15");
    oForm.moType = *oType;
    const std::string interleave = HeaderText::Normalise(oHeader.GetText("interleave"));
    const auto* const pFound = std::find_if(std::begin(INTERLEAVES), std::end(INTERLEAVES),
                                            [&interleave](const auto& oOne) { return oOne.first == interleave; });
    if (pFound == std::end(INTERLEAVES) && !interleave.empty())
        Refuse(name, "interleave", interleave, "bsq, bil or bip");
    if (pFound != std::end(INTERLEAVES))
        oForm.meInterleave = pFound->second;
    else if (oForm.mnChannels > 1)
        throw FileFormatException(name, name + ": the header of several bands has no \"interleave\"");
    return oForm;
}

void WriteForm(const RawForm& oForm, HeaderText& oHeader)
{
    oHeader.Set("samples", std::to_string(oForm.mnWidth));
    oHeader.Set("lines", std::to_string(oForm.mnHeight));
    oHeader.Set("bands", std::to_string(oForm.mnChannels));
    oHeader.Set("header offset", std::to_string(oForm.mnOffset));
    oHeader.Set("file type", "ENVI Standard");
    oHeader.Set("data type", std::to_string(FindTypeCode(oForm.moType)));
    for (const auto& [pName, eInterleave] : INTERLEAVES)
        if (eInterleave == oForm.meInterleave)
            oHeader.Set("interleave", pName);
    oHeader.Set("byte order", oForm.mbBigEndian ? "1" : "0");
}

std::optional<std::uint64_t> RawForm::CountBytes() const
{
    // Width and height are below 2^31, channels below 2^17, and values have up to 16 bytes.
    const std::uint64_t nValueBytes = moType.GetValueBits() / 8;
    const std::uint64_t nPixels = std::uint64_t{mnWidth} * mnHeight;
    constexpr std::uint64_t MOST = std::uint64_t{1} << 62;
    // Of rows and gaps between channels below 2^44.
    const std::uint64_t nParts = meInterleave == Interleave::eBand ? mnChannels : 1;
    if (mnRowBytes > MOST / mnHeight / nParts || mnOffset > MOST)
        return std::nullopt;
    if (mnRowBytes != 0)
        return mnRowBytes * mnHeight * nParts + (nParts - 1) * mnBandGap + mnOffset;
    if (nPixels > MOST / (nValueBytes * mnChannels))
        return std::nullopt;
    return nPixels * nValueBytes * mnChannels + mnOffset;
}

support::ImageLayout RawForm::MakeLayout() const
{
    constexpr unsigned int BLOCK_ROWS = 256;
    std::vector<support::Plane> oPlanes;
    if (meInterleave == Interleave::ePixel)
        oPlanes.push_back({moType, mnChannels, {}});
    else
        oPlanes.assign(mnChannels, {moType, 1, {}});
    return {mnWidth, mnHeight, mnWidth, std::min(mnHeight, BLOCK_ROWS), std::move(oPlanes)};
}

std::vector<support::PlainSource::Placement> RawForm::PlacePlanes() const
{
    using support::PlainSource;
    if (mnRowBytes == 0)
        return PlainSource::PlacePlanes(MakeLayout(), mnOffset,
                                        meInterleave == Interleave::eLine ? PlainSource::Order::eLine
                                                                          : PlainSource::Order::eBand);
    const std::uint64_t nApart =
        meInterleave == Interleave::eBand ? mnRowBytes * mnHeight + mnBandGap : mnChannelRowBytes;
    std::vector<PlainSource::Placement> oPlacements;
    for (unsigned int nChannel = 0; nChannel < (meInterleave == Interleave::ePixel ? 1 : mnChannels); ++nChannel)
        oPlacements.push_back({mnOffset + nChannel * nApart, mnRowBytes});
    return oPlacements;
}

bool RawForm::IsSwapped() const
{
    return moType.GetBits() > 8 && mbBigEndian != (std::endian::native == std::endian::big);
}

} // namespace krv::plugins::raw
