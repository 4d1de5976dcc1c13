#include "plugins/gdball/pictures/pnmheader.h"

#include "toolkit/core/numbertext.h"

#include <limits>
#include <string_view>

namespace krv::plugins::gdball
{

namespace
{

bool IsBlank(unsigned char nByte)
{
    return nByte == ' ' || (nByte >= '\t' && nByte <= '\r');
}

// The next word and the single blank behind it; empty when the bytes end first.
std::string TakeWord(const unsigned char* pBytes, std::size_t nBytes, std::size_t& nAt)
{
    constexpr std::size_t LONGEST = 32;
    bool bComment = false;
    for (; nAt < nBytes && (bComment || IsBlank(pBytes[nAt]) || pBytes[nAt] == '#'); ++nAt)
        bComment = pBytes[nAt] == '#' || (bComment && pBytes[nAt] != '\n' && pBytes[nAt] != '\r');
    std::string word;
    for (; nAt < nBytes && !IsBlank(pBytes[nAt]) && word.size() < LONGEST; ++nAt)
        word += static_cast<char>(pBytes[nAt]);
    const bool bWhole = nAt < nBytes && IsBlank(pBytes[nAt]);
    ++nAt;
    return bWhole ? word : std::string();
}

} // namespace

std::uint64_t PnmHeader::CountPixelBytes() const
{
    constexpr std::uint64_t MOST = std::numeric_limits<std::uint64_t>::max();
    constexpr std::uint64_t MOST_SIDE = std::uint64_t{1} << 31;
    if (mnWidth > MOST_SIDE || mnHeight > MOST_SIDE)
        return MOST;
    if (mnKind == '4')
        return (mnWidth + 7) / 8 * mnHeight;
    const bool bWide = !IsReal() && !IsBits() && ParseNumber<std::uint32_t>(moMaximum).value_or(0) > 255;
    // Text has a digit for each sample, and blanks between those that are no single bits.
    const std::uint64_t nEach = IsReal() ? 4 : IsText() ? (IsBits() ? 1 : 2) : bWide ? 2 : 1;
    const std::uint64_t nSamples = mnWidth * mnHeight;
    return nSamples / GetChannels() > MOST / 16 / GetChannels()
               ? MOST
               : nSamples * GetChannels() * nEach - (nEach == 2 && IsText());
}

std::string PnmHeader::Write() const
{
    return std::string("P") + mnKind + "\n" + std::to_string(mnWidth) + " " + std::to_string(mnHeight) + "\n" +
           (moMaximum.empty() ? "" : moMaximum + "\n");
}

std::optional<PnmHeader> ParsePnmHeader(const unsigned char* pBytes, std::size_t nBytes)
{
    constexpr std::string_view KINDS = "123456fF";
    if (nBytes < 3 || pBytes[0] != 'P' || KINDS.find(static_cast<char>(pBytes[1])) == std::string_view::npos ||
        !(IsBlank(pBytes[2]) || pBytes[2] == '#'))
        return std::nullopt;
    PnmHeader oHeader;
    oHeader.mnKind = static_cast<char>(pBytes[1]);
    std::size_t nAt = 2;
    const auto oWidth = ParseNumber<std::uint32_t>(TakeWord(pBytes, nBytes, nAt));
    const auto oHeight = ParseNumber<std::uint32_t>(TakeWord(pBytes, nBytes, nAt));
    if (!oWidth || !oHeight || *oWidth == 0 || *oHeight == 0)
        return std::nullopt;
    oHeader.mnWidth = *oWidth;
    oHeader.mnHeight = *oHeight;
    if (!oHeader.IsBits())
    {
        oHeader.moMaximum = TakeWord(pBytes, nBytes, nAt);
        const auto oMaximum = ParseNumber<double>(oHeader.moMaximum);
        if (!oMaximum || (!oHeader.IsReal() && (*oMaximum < 1 || *oMaximum > 65535)) || *oMaximum == 0)
            return std::nullopt;
    }
    oHeader.mnBytes = nAt;
    return oHeader;
}

} // namespace krv::plugins::gdball
