#include "toolkit/xml/xmlutil.h"

#include <cstdint>

namespace
{

constexpr char32_t REPLACEMENT = 0xFFFD;

bool IsSurrogate(char32_t nCode)
{
    return nCode >= 0xD800 && nCode <= 0xDFFF;
}

bool IsContinuation(char nByte)
{
    return (static_cast<unsigned char>(nByte) & 0xC0U) == 0x80U;
}

// Takes one character off the front of a text that is not empty.
char32_t TakeUtf8(std::string_view& text)
{
    const auto nLead = static_cast<unsigned char>(text.front());
    text.remove_prefix(1);
    if (nLead < 0x80)
        return nLead;
    const unsigned int nFollowing = nLead >= 0xF0 ? 3 : nLead >= 0xE0 ? 2 : 1;
    if (nLead < 0xC2 || nLead > 0xF4 || text.size() < nFollowing)
        return REPLACEMENT;
    constexpr char32_t SMALLEST[] = {0, 0x80, 0x800, 0x10000};
    char32_t nCode = nLead & (0x3FU >> nFollowing);
    for (unsigned int nAt = 0; nAt < nFollowing; ++nAt)
    {
        if (!IsContinuation(text[nAt]))
            return REPLACEMENT;
        nCode = (nCode << 6U) | (static_cast<unsigned char>(text[nAt]) & 0x3FU);
    }
    if (nCode < SMALLEST[nFollowing] || nCode > 0x10FFFF || IsSurrogate(nCode))
        return REPLACEMENT;
    text.remove_prefix(nFollowing);
    return nCode;
}

void AppendUtf16(std::basic_string<XMLCh>& result, char32_t nCode)
{
    if (nCode < 0x10000)
    {
        result.push_back(static_cast<XMLCh>(nCode));
        return;
    }
    nCode -= 0x10000;
    result.push_back(static_cast<XMLCh>(0xD800 + (nCode >> 10U)));
    result.push_back(static_cast<XMLCh>(0xDC00 + (nCode & 0x3FFU)));
}

void AppendUtf8(std::string& result, char32_t nCode)
{
    const auto Append = [&result](char32_t nByte)
    {
        result.push_back(static_cast<char>(nByte));
    };
    if (nCode < 0x80)
        return Append(nCode);
    if (nCode < 0x800)
        Append(0xC0U | (nCode >> 6U));
    else
    {
        if (nCode < 0x10000)
            Append(0xE0U | (nCode >> 12U));
        else
        {
            Append(0xF0U | (nCode >> 18U));
            Append(0x80U | ((nCode >> 12U) & 0x3FU));
        }
        Append(0x80U | ((nCode >> 6U) & 0x3FU));
    }
    Append(0x80U | (nCode & 0x3FU));
}

} // namespace

std::basic_string<XMLCh> XmlTranscode(std::string_view text)
{
    std::basic_string<XMLCh> result;
    result.reserve(text.size());
    while (!text.empty())
        AppendUtf16(result, TakeUtf8(text));
    return result;
}

std::string XmlTranscode(const XMLCh* poText)
{
    return poText == nullptr ? std::string() : XmlTranscode(poText, std::char_traits<XMLCh>::length(poText));
}

std::string XmlTranscode(const XMLCh* poText, std::size_t nLength)
{
    std::string result;
    result.reserve(nLength);
    for (std::size_t nAt = 0; nAt < nLength; ++nAt)
    {
        char32_t nCode = poText[nAt];
        if (nCode >= 0xD800 && nCode < 0xDC00 && nAt + 1 < nLength && (poText[nAt + 1] & 0xFC00) == 0xDC00)
            nCode = 0x10000 + ((nCode - 0xD800) << 10U) + (poText[++nAt] - 0xDC00U);
        AppendUtf8(result, IsSurrogate(nCode) ? REPLACEMENT : nCode);
    }
    return result;
}
