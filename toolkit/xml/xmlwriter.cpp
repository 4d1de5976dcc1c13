#include "toolkit/xml/xmlwriter.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace krv::xml
{

namespace
{

// Length of the character of UTF-8 at a place; 0 when there is none that XML takes.
std::size_t CharacterBytes(std::string_view text, std::size_t nAt)
{
    const auto nFirst = static_cast<unsigned char>(text[nAt]);
    if (nFirst < 0x80)
        return nFirst >= 0x20 || nFirst == '\t' || nFirst == '\n' || nFirst == '\r' ? 1 : 0;
    const std::size_t nBytes = nFirst >= 0xF0 ? 4 : nFirst >= 0xE0 ? 3 : 2;
    if (nFirst < 0xC2 || nFirst > 0xF4 || nAt + nBytes > text.size())
        return 0;
    std::uint32_t nCode = nFirst & (0x7Fu >> nBytes);
    for (std::size_t nNext = 1; nNext < nBytes; ++nNext)
    {
        const auto nByte = static_cast<unsigned char>(text[nAt + nNext]);
        if ((nByte & 0xC0) != 0x80)
            return 0;
        nCode = nCode << 6 | (nByte & 0x3Fu);
    }
    const bool bOverlong = (nBytes == 3 && nCode < 0x800) || (nBytes == 4 && nCode < 0x10000);
    const bool bAllowed = nCode <= 0x10FFFF && (nCode < 0xD800 || nCode > 0xDFFF) && nCode != 0xFFFE && nCode != 0xFFFF;
    return bAllowed && !bOverlong ? nBytes : 0;
}

std::string Escape(std::string_view text, bool bAttribute)
{
    // The last three only where they would end an attribute or become blanks in it.
    constexpr std::pair<char, std::string_view> ESCAPES[] = {{'&', "&amp;"},  {'<', "&lt;"},   {'>', "&gt;"},
                                                             {'\r', "&#13;"}, {'"', "&quot;"}, {'\n', "&#10;"},
                                                             {'\t', "&#9;"}};
    const auto* const pEnd = std::end(ESCAPES) - (bAttribute ? 0 : 3);
    std::string result;
    for (const char nCharacter : text)
    {
        const auto* const pFound =
            std::find_if(std::begin(ESCAPES), pEnd, [&](const auto& oEscape) { return oEscape.first == nCharacter; });
        result += pFound == pEnd ? std::string_view(&nCharacter, 1) : pFound->second;
    }
    return result;
}

void Append(std::string& text, const Element& oElement)
{
    text += "<" + oElement.name;
    for (const auto& [name, value] : oElement.attributes)
        text += " " + name + "=\"" + Escape(value, true) + "\"";
    text += ">" + Escape(oElement.text, false);
    for (const Element& oChild : oElement.children)
        Append(text, oChild);
    text += "</" + oElement.name + ">";
}

} // namespace

bool IsXmlText(std::string_view text)
{
    std::size_t nBytes = 1;
    for (std::size_t nAt = 0; nAt < text.size() && nBytes != 0; nAt += nBytes)
        nBytes = CharacterBytes(text, nAt);
    return nBytes != 0;
}

std::string MakeXmlText(std::string_view text)
{
    std::string likeness;
    for (std::size_t nAt = 0; nAt < text.size();)
    {
        const std::size_t nBytes = CharacterBytes(text, nAt);
        const auto nByte = static_cast<unsigned char>(text[nAt]);
        if (nBytes != 0)
            likeness += text.substr(nAt, nBytes);
        else if (nByte >= 0x80)
            likeness.append({static_cast<char>(0xC0 | nByte >> 6), static_cast<char>(0x80 | (nByte & 0x3F))});
        else
            likeness += '?';
        nAt += std::max<std::size_t>(nBytes, 1);
    }
    return likeness;
}

std::string WriteTree(const Element& oRoot)
{
    std::string text;
    Append(text, oRoot);
    return text;
}

} // namespace krv::xml
