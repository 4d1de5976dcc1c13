#include "plugins/support/file/iccprofile.h"

#include "plugins/support/file/numbers.h"

#include <algorithm>
#include <cstdint>
#include <cstring>

namespace krv::plugins::support
{

std::string ReadProfileName(const unsigned char* pBytes, std::size_t nBytes)
{
    constexpr std::size_t TAGS = 128;
    constexpr std::uint64_t DESCRIPTION = 0x64657363;    // desc
    constexpr std::uint64_t MANY_LANGUAGES = 0x6D6C7563; // mluc
    if (nBytes < TAGS + 4)
        return {};
    const std::size_t nTags = static_cast<std::size_t>(ReadNumber(pBytes + TAGS, 4, true));
    for (std::size_t nTag = 0; nTag < nTags && TAGS + 16 + 12 * nTag <= nBytes; ++nTag)
    {
        const unsigned char* pTag = pBytes + TAGS + 4 + 12 * nTag;
        const std::uint64_t nOffset = ReadNumber(pTag + 4, 4, true), nSize = ReadNumber(pTag + 8, 4, true);
        if (ReadNumber(pTag, 4, true) != DESCRIPTION || nSize < 28 || nOffset + nSize > nBytes)
            continue;
        const unsigned char* pText = pBytes + nOffset;
        std::string name;
        if (ReadNumber(pText, 4, true) == DESCRIPTION)
        {
            const std::uint64_t nLength = std::min<std::uint64_t>(ReadNumber(pText + 8, 4, true), nSize - 12);
            name.assign(pText + 12, pText + 12 + nLength);
        }
        else if (ReadNumber(pText, 4, true) == MANY_LANGUAGES)
        {
            const std::uint64_t nLength = ReadNumber(pText + 20, 4, true), nText = ReadNumber(pText + 24, 4, true);
            if (nText + nLength <= nSize)
                for (std::uint64_t nAt = 1; nAt < nLength; nAt += 2)
                    name += static_cast<char>(pText[nText + nAt - 1] == 0 ? pText[nText + nAt] : '?');
        }
        name.resize(strnlen(name.c_str(), name.size()));
        const auto IsPlain = [](char nLetter)
        {
            return nLetter >= ' ' && nLetter <= '~';
        };
        return std::all_of(name.begin(), name.end(), IsPlain) ? name : std::string();
    }
    return {};
}

} // namespace krv::plugins::support
