#include "datasources/metadata/detail/keypattern.h"

#include <algorithm>
#include <utility>

namespace krv::qrfutils::detail
{

namespace
{

constexpr std::string_view SPECIAL = R"(.[{()\*+?|^$)";
constexpr std::string_view NUMBER = "[0-9]+";
constexpr std::string_view ESCAPED_NUMBER = R"(\[0-9]+)";

constexpr std::array<unsigned char, 256> MakeFolding(bool bCaseInsensitive)
{
    std::array<unsigned char, 256> oFolding{};
    for (unsigned int n = 0; n < 256; ++n)
        oFolding[n] = static_cast<unsigned char>(bCaseInsensitive && n >= 'A' && n <= 'Z' ? n + ('a' - 'A') : n);
    return oFolding;
}

constexpr std::array<unsigned char, 256> EXACT = MakeFolding(false);
constexpr std::array<unsigned char, 256> FOLDED = MakeFolding(true);

bool IsSeparator(char cByte)
{
    return cByte == '\n' || cByte == '\r' || cByte == '\f';
}

// The loop has no early end, which lets the compiler take many bytes at once: keys are short.
bool IsOneLine(std::string_view key)
{
    unsigned int nSeparators = 0;
    for (const char cByte : key)
        nSeparators += IsSeparator(cByte) ? 1u : 0u;
    return nSeparators == 0;
}

bool IsInsideLineBreak(std::string_view key, std::size_t nAt)
{
    return nAt > 0 && nAt < key.size() && key[nAt - 1] == '\r' && key[nAt] == '\n';
}

bool IsLineStart(std::string_view key, std::size_t nAt)
{
    return nAt == 0 || (IsSeparator(key[nAt - 1]) && !IsInsideLineBreak(key, nAt));
}

bool IsLineEnd(std::string_view key, std::size_t nAt)
{
    return nAt == key.size() || (IsSeparator(key[nAt]) && !IsInsideLineBreak(key, nAt));
}

bool IsAllowed(std::string_view key, std::size_t nBegin, std::size_t nEnd, const KeySegment::Anchors& oAnchors)
{
    return (!oAnchors.mbLineStart || IsLineStart(key, nBegin)) && (!oAnchors.mbLineEnd || IsLineEnd(key, nEnd));
}

// Takes the literal text at the front of the pattern; nothing when an operator other than ".*" follows it.
std::optional<std::string> TakeText(std::string_view& pattern)
{
    std::string text;
    while (!pattern.empty() && !pattern.starts_with(".*"))
    {
        const bool bEscaped = pattern[0] == '\\';
        if (bEscaped)
            pattern.remove_prefix(1);
        if (pattern.empty() || bEscaped != (SPECIAL.find(pattern[0]) != std::string_view::npos))
            return std::nullopt;
        text += pattern[0];
        pattern.remove_prefix(1);
    }
    return text;
}

} // namespace

KeySegment::KeySegment(std::string text, bool bCaseInsensitive)
    : moText(std::move(text)), moBorders(moText.size() + 1), mpoFolding(bCaseInsensitive ? &FOLDED : &EXACT)
{
    for (char& cByte : moText)
        cByte = static_cast<char>(Fold(cByte));
    std::size_t nBorder = 0;
    for (std::size_t n = 1; n < moText.size(); ++n)
    {
        while (nBorder > 0 && moText[n] != moText[nBorder])
            nBorder = moBorders[nBorder];
        if (moText[n] == moText[nBorder])
            ++nBorder;
        moBorders[n + 1] = nBorder;
    }
}

std::size_t KeySegment::Find(std::string_view key, std::size_t nFrom, const Anchors& oAnchors) const
{
    if ((oAnchors.mbLineStart || oAnchors.mbLineEnd) && IsOneLine(key))
        return FindInLine(key, nFrom, oAnchors);
    return FindAnywhere(key, nFrom, oAnchors);
}

bool KeySegment::LiesAt(std::string_view key, std::size_t nAt) const
{
    const auto oSame = [this](char cText, char cKey)
    {
        return cText == static_cast<char>(Fold(cKey));
    };
    return key.size() - nAt >= moText.size() && std::equal(moText.begin(), moText.end(), key.begin() + nAt, oSame);
}

std::size_t KeySegment::FindInLine(std::string_view key, std::size_t nFrom, const Anchors& oAnchors) const
{
    const std::size_t nLength = moText.size();
    if (key.size() - nFrom < nLength || (oAnchors.mbLineStart && oAnchors.mbLineEnd && key.size() != nLength))
        return std::string_view::npos;
    const std::size_t nAt = oAnchors.mbLineStart ? nFrom : key.size() - nLength;
    return LiesAt(key, nAt) ? nAt + nLength : std::string_view::npos;
}

std::size_t KeySegment::FindAnywhere(std::string_view key, std::size_t nFrom, const Anchors& oAnchors) const
{
    const std::size_t nLength = moText.size();
    std::size_t nMatched = 0;
    for (std::size_t nEnd = nFrom;; ++nEnd)
    {
        if (nMatched == nLength)
        {
            if (IsAllowed(key, nEnd - nLength, nEnd, oAnchors))
                return nEnd;
            nMatched = moBorders[nMatched];
        }
        if (nEnd == key.size())
            return std::string_view::npos;
        const auto cByte = static_cast<char>(Fold(key[nEnd]));
        while (nMatched > 0 && moText[nMatched] != cByte)
            nMatched = moBorders[nMatched];
        if (nLength > 0 && moText[nMatched] == cByte)
            ++nMatched;
    }
}

std::optional<KeyPattern> KeyPattern::Parse(const std::string& pattern, bool bCaseInsensitive)
{
    KeyPattern oParsed;
    std::string_view rest = pattern;
    oParsed.mbLineStart = rest.starts_with('^');
    if (oParsed.mbLineStart)
        rest.remove_prefix(1);
    oParsed.mbLineEnd = rest.ends_with('$') && !rest.ends_with("\\$");
    if (oParsed.mbLineEnd)
        rest.remove_suffix(1);
    oParsed.mbNumber =
        oParsed.mbLineStart && oParsed.mbLineEnd && rest.ends_with(NUMBER) && !rest.ends_with(ESCAPED_NUMBER);
    if (oParsed.mbNumber)
        rest.remove_suffix(NUMBER.size());
    for (;;)
    {
        auto oText = TakeText(rest);
        if (!oText)
            return std::nullopt;
        oParsed.moSegments.emplace_back(std::move(*oText), bCaseInsensitive);
        if (rest.empty())
            return oParsed;
        if (oParsed.mbNumber)
            return std::nullopt;
        rest.remove_prefix(2);
    }
}

bool KeyPattern::SearchNumber(std::string_view key) const
{
    const KeySegment& oText = moSegments.front();
    for (std::size_t nAt = 0; nAt <= key.size(); ++nAt)
    {
        if (!IsLineStart(key, nAt) || !oText.LiesAt(key, nAt))
            continue;
        const std::size_t nNumber = nAt + oText.GetLength();
        const std::size_t nEnd = std::min(key.find_first_not_of("0123456789", nNumber), key.size());
        if (nEnd > nNumber && IsLineEnd(key, nEnd))
            return true;
    }
    return false;
}

bool KeyPattern::Search(std::string_view key) const
{
    if (mbNumber)
        return SearchNumber(key);
    std::size_t nAt = 0;
    for (std::size_t n = 0; n < moSegments.size(); ++n)
    {
        const bool bFirst = n == 0;
        const bool bLast = n + 1 == moSegments.size();
        nAt = moSegments[n].Find(key, nAt, {bFirst && mbLineStart, bLast && mbLineEnd});
        if (nAt == std::string_view::npos)
            return false;
    }
    return true;
}

} // namespace krv::qrfutils::detail
