#include "plugins/raw/headertext.h"

#include <algorithm>

namespace krv::plugins::raw
{

namespace
{

constexpr std::string_view FIRST_LINE = "ENVI";
constexpr std::string_view BLANKS = " \t\r\n\v\f";

std::string_view Trim(std::string_view text)
{
    const std::size_t nFirst = text.find_first_not_of(BLANKS);
    return nFirst == std::string_view::npos ? std::string_view()
                                            : text.substr(nFirst, text.find_last_not_of(BLANKS) - nFirst + 1);
}

// A line with its end; the text begins behind it then.
std::string_view TakeLine(std::string_view& text)
{
    const std::size_t nEnd = std::min(text.find('\n'), text.size() - 1) + 1;
    const std::string_view line = text.substr(0, nEnd);
    text.remove_prefix(nEnd);
    return line;
}

std::string_view StripBraces(std::string_view value)
{
    if (!value.starts_with('{'))
        return value;
    value.remove_prefix(1);
    return Trim(value.substr(0, value.rfind('}')));
}

} // namespace

bool HeaderText::IsHeader(std::string_view bytes)
{
    if (!bytes.starts_with(FIRST_LINE))
        return false;
    const std::size_t nNext = bytes.find_first_not_of(" \t", FIRST_LINE.size());
    return nNext != std::string_view::npos && (bytes[nNext] == '\r' || bytes[nNext] == '\n');
}

HeaderText::HeaderText(std::string_view text)
{
    if (IsHeader(text))
        TakeLine(text);
    while (!text.empty())
    {
        const std::string_view before = text;
        const std::string_view line = TakeLine(text);
        const std::size_t nSign = line.find('=');
        Entry oEntry;
        if (!Trim(line).starts_with(';') && nSign != std::string_view::npos)
        {
            oEntry.moKey = Trim(line.substr(0, nSign));
            if (Trim(line.substr(nSign + 1)).starts_with('{') && line.find('}', nSign) == std::string_view::npos)
                while (!text.empty() && TakeLine(text).find('}') == std::string_view::npos)
                    continue;
        }
        oEntry.moLines = before.substr(0, before.size() - text.size());
        if (!oEntry.moKey.empty())
            oEntry.moValue = Trim(std::string_view(oEntry.moLines).substr(nSign + 1));
        moEntries.push_back(std::move(oEntry));
    }
}

std::string HeaderText::Normalise(std::string_view key)
{
    std::string normal;
    for (const char c : Trim(key))
    {
        const bool bBlank = BLANKS.find(c) != std::string_view::npos;
        if (!bBlank)
            normal += c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
        else if (normal.back() != ' ')
            normal += ' ';
    }
    return normal;
}

std::optional<std::string> HeaderText::Find(std::string_view key) const
{
    const std::string normal = Normalise(key);
    const auto oFound = std::find_if(moEntries.rbegin(), moEntries.rend(),
                                     [&normal](const Entry& oEntry)
                                     { return !oEntry.moKey.empty() && Normalise(oEntry.moKey) == normal; });
    return oFound == moEntries.rend() ? std::nullopt : std::optional(oFound->moValue);
}

std::string HeaderText::GetText(std::string_view key) const
{
    const auto oValue = Find(key);
    return oValue ? std::string(StripBraces(*oValue)) : std::string();
}

std::vector<std::string> HeaderText::GetList(std::string_view key) const
{
    std::vector<std::string> oParts;
    const std::string text = GetText(key);
    if (text.empty())
        return oParts;
    for (std::string_view rest = text;;)
    {
        const std::size_t nComma = rest.find(',');
        oParts.emplace_back(Trim(rest.substr(0, nComma)));
        if (nComma == std::string_view::npos)
            return oParts;
        rest.remove_prefix(nComma + 1);
    }
}

std::vector<std::string> HeaderText::GetKeys() const
{
    std::vector<std::string> oKeys;
    for (const Entry& oEntry : moEntries)
        if (!oEntry.moKey.empty())
            oKeys.push_back(oEntry.moKey);
    return oKeys;
}

void HeaderText::Set(const std::string& key, const std::string& value)
{
    const std::string normal = Normalise(key);
    const auto oFound = std::find_if(moEntries.begin(), moEntries.end(),
                                     [&normal](const Entry& oEntry)
                                     { return !oEntry.moKey.empty() && Normalise(oEntry.moKey) == normal; });
    const std::string written = oFound == moEntries.end() ? key : oFound->moKey;
    const auto oValue = Find(key);
    if (oValue && *oValue == value)
        return;
    Entry oNew{written, value, written + " = " + value + "\n"};
    if (oFound == moEntries.end())
        return moEntries.push_back(std::move(oNew));
    *oFound = std::move(oNew);
    moEntries.erase(std::remove_if(oFound + 1, moEntries.end(),
                                   [&normal](const Entry& oEntry)
                                   { return !oEntry.moKey.empty() && Normalise(oEntry.moKey) == normal; }),
                    moEntries.end());
}

void HeaderText::SetList(const std::string& key, const std::vector<std::string>& oParts)
{
    if (GetList(key) == oParts)
        return;
    std::string text;
    for (const std::string& part : oParts)
        text += (text.empty() ? "{" : ", ") + part;
    Set(key, text + "}");
}

void HeaderText::Remove(std::string_view key)
{
    const std::string normal = Normalise(key);
    std::erase_if(moEntries, [&normal](const Entry& oEntry)
                  { return !oEntry.moKey.empty() && Normalise(oEntry.moKey) == normal; });
}

bool HeaderText::CanHold(const std::string& key, const std::string& value)
{
    const HeaderText oRead(std::string(FIRST_LINE) + "\n" + key + " = " + value + "\n");
    return oRead.moEntries.size() == 1 && oRead.moEntries.front().moKey == key &&
           oRead.moEntries.front().moValue == value;
}

bool HeaderText::CanHoldList(const std::vector<std::string>& oParts)
{
    const auto IsFree = [](const std::string& part)
    {
        return part.find_first_of(",{}\n\r") == std::string::npos && Trim(part) == part;
    };
    // A list of one empty part is an empty list.
    return std::all_of(oParts.begin(), oParts.end(), IsFree) && !(oParts.size() == 1 && oParts.front().empty());
}

std::string HeaderText::Write() const
{
    std::string text = std::string(FIRST_LINE) + "\n";
    for (const Entry& oEntry : moEntries)
    {
        if (text.back() != '\n')
            text += '\n';
        text += oEntry.moLines;
    }
    return text;
}

} // namespace krv::plugins::raw
