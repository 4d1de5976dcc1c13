#include "datasources/metadata/typednodata.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/detail/metadatakeys.h"
#include "gobs/mask/exactmaskdecision.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <limits>
#include <string_view>

namespace krv::datasources
{

namespace
{

std::string_view Trim(std::string_view text)
{
    constexpr std::string_view SPACE = " \t\n\v\f\r";
    const auto nFirst = text.find_first_not_of(SPACE);
    if (nFirst == std::string_view::npos)
        return {};
    return text.substr(nFirst, text.find_last_not_of(SPACE) - nFirst + 1);
}

// The lower-case word, in any letter case.
bool IsWord(std::string_view text, std::string_view word)
{
    const auto oSame = [](char cText, char cWord)
    {
        return cText == cWord || cText == cWord - ('a' - 'A');
    };
    return std::equal(text.begin(), text.end(), word.begin(), word.end(), oSame);
}

std::optional<double> ParseName(std::string_view text)
{
    if (IsWord(text, "nan"))
        return std::numeric_limits<double>::quiet_NaN();
    if (IsWord(text, "inf") || IsWord(text, "infinity"))
        return std::numeric_limits<double>::infinity();
    return std::nullopt;
}

// The whole text, without a sign.
template <class Number, class Format>
std::optional<Number> Convert(std::string_view text, Format oFormat)
{
    Number nValue{};
    const auto [pEnd, eError] = std::from_chars(text.data(), text.data() + text.size(), nValue, oFormat);
    if (eError != std::errc() || pEnd != text.data() + text.size())
        return std::nullopt;
    return nValue;
}

std::optional<NoDataValue> MakeInteger(std::uint64_t nMagnitude, bool bNegative)
{
    constexpr std::uint64_t LIMIT = std::uint64_t{1} << 63;
    if (!bNegative)
        return NoDataValue::FromUnsigned(nMagnitude);
    if (nMagnitude > LIMIT)
        return std::nullopt;
    return NoDataValue::FromSigned(static_cast<std::int64_t>(0 - nMagnitude));
}

// Files hold the largest double printed with too few digits, which rounds beyond it: that much over is the largest
// double. Anything larger is no double.
std::optional<double> NearestDouble(std::optional<long double> nValue)
{
    constexpr long double LARGEST = std::numeric_limits<double>::max();
    if (!nValue || *nValue > LARGEST * (1 + 1e-6L))
        return std::nullopt;
    return static_cast<double>(std::min(*nValue, LARGEST));
}

std::optional<NoDataValue> MakeReal(std::optional<double> nMagnitude, bool bNegative)
{
    if (!nMagnitude)
        return std::nullopt;
    return NoDataValue::FromReal(bNegative ? -*nMagnitude : *nMagnitude);
}

bool TakePrefix(std::string_view& text, std::string_view prefix)
{
    const bool bFound = text.size() > prefix.size() && IsWord(text.substr(0, prefix.size()), prefix);
    if (bFound)
        text.remove_prefix(prefix.size());
    return bFound;
}

bool BeginsNumber(std::string_view text)
{
    return !text.empty() && text[0] != '+' && text[0] != '-';
}

} // namespace

std::optional<NoDataValue> ParseNoData(const std::string& text)
{
    std::string_view rest = Trim(text);
    const bool bNegative = rest.starts_with('-');
    if (bNegative || rest.starts_with('+'))
        rest.remove_prefix(1);
    if (const auto nNamed = ParseName(rest))
        return MakeReal(nNamed, bNegative);
    const bool bHexadecimal = TakePrefix(rest, "0x");
    if (!BeginsNumber(rest))
        return std::nullopt;
    if (const auto nInteger = Convert<std::uint64_t>(rest, bHexadecimal ? 16 : 10))
    {
        if (const auto oInteger = MakeInteger(*nInteger, bNegative))
            return oInteger;
    }
    // The conversion knows the names too; they stand alone and have no digits before them.
    if (rest.find_first_of("nN") != std::string_view::npos)
        return std::nullopt;
    const auto eFormat = bHexadecimal ? std::chars_format::hex : std::chars_format::general;
    return MakeReal(NearestDouble(Convert<long double>(rest, eFormat)), bNegative);
}

std::string GetNoDataText(const AuxiliaryData& oMetadata, unsigned int nChannel)
{
    std::string text(Trim(oMetadata.GetChanMetadataValue(detail::NO_DATA_VALUE, nChannel)));
    if (text.empty())
        text = Trim(oMetadata.GetFileMetadataValue(detail::NO_DATA_VALUE));
    return text;
}

void SetTypedNoData(AuxiliaryData& oMetadata, const NoDataValue& oValue, unsigned int nChannel)
{
    oMetadata.SetChanMetadataValue(detail::NO_DATA_VALUE, oValue.GetText(), nChannel);
}

void SetFileNoData(AuxiliaryData& oMetadata, const NoDataValue& oValue)
{
    oMetadata.SetFileMetadataValue(detail::NO_DATA_VALUE, oValue.GetText());
}

std::optional<NoDataValue> GetTypedNoData(const AuxiliaryData& oMetadata, unsigned int nChannel)
{
    const std::string text = GetNoDataText(oMetadata, nChannel);
    if (text.empty())
        return std::nullopt;
    const std::optional<NoDataValue> oValue = ParseNoData(text);
    if (!oValue)
        throw krv::DataException("Could not parse nodata value \"" + text + "\"");
    return oValue;
}

krv::gobs::IMaskBuilder* GetTypedNoDataMaskBuilder(const AuxiliaryData& oMetadata, krv::gobs::BkgdRule eRule,
                                                   bool bNaNIsBackground)
{
    std::vector<unsigned int> oChannels;
    std::vector<NoDataValue> oValues;
    for (unsigned int nChannel = 1; nChannel <= oMetadata.GetChannelCount(); ++nChannel)
    {
        if (const auto oValue = GetTypedNoData(oMetadata, nChannel))
        {
            oChannels.push_back(nChannel);
            oValues.push_back(*oValue);
        }
    }
    const krv::gobs::ExactMaskDecision oDecision(eRule, oValues, oChannels, bNaNIsBackground);
    return new krv::gobs::MaskDecisionBuilder(&oDecision);
}

} // namespace krv::datasources
