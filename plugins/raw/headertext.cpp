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

// A line with its end, any of the three that there are; the text begins behind it then.
std::string_view TakeLine(std::string_view& text)
{
    std::size_t nEnd = std::min(text.find_first_of("\r\n"), text.size() - 1) + 1;
    nEnd += text.substr(nEnd - 1).starts_with("\r\n") ? 1 : 0;
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
            const std::string_view value = Trim(line.substr(nSign + 1));
            const bool bNext = value.empty() && Trim(text).starts_with('{');
            if (bNext || (value.starts_with('{') && line.find('}', nSign) == std::string_view::npos))
                while (!text.empty() && TakeLine(text).find('}') == std::string_view::npos)
                    continue;
        }
        oEntry.moLines = before.substr(0, before.size() - text.size());
        if (!oEntry.moKey.empty())
            oEntry.moValue = Trim(std::string_view(oEntry.moLines).substr(nSign + 1));
        Add(std::move(oEntry));
    }
}

void HeaderText::Add(Entry oEntry)
{
    if (!oEntry.moKey.empty())
        moPlaces[Normalise(oEntry.moKey)].push_back(moEntries.size());
    moEntries.push_back(std::move(oEntry));
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
    const auto oFound = moPlaces.find(Normalise(key));
    return oFound == moPlaces.end() ? std::nullopt : std::optional(moEntries[oFound->second.back()].moValue);
}

bool HeaderText::IsContradicted(std::string_view key) const
{
    const auto oFound = moPlaces.find(Normalise(key));
    return oFound != moPlaces.end() &&
           std::any_of(oFound->second.begin(), oFound->second.end(),
                       [&](std::size_t nPlace)
                       { return moEntries[nPlace].moValue != moEntries[oFound->second.back()].moValue; });
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
    const auto oFound = moPlaces.find(Normalise(key));
    if (oFound == moPlaces.end())
        return Add({key, value, key + " = " + value + "\n"});
    std::vector<std::size_t>& oPlaces = oFound->second;
    if (moEntries[oPlaces.back()].moValue == value)
        return;
    const std::string written = moEntries[oPlaces.front()].moKey;
    for (const std::size_t nPlace : oPlaces)
        moEntries[nPlace] = {};
    oPlaces.resize(1);
    moEntries[oPlaces.front()] = {written, value, written + " = " + value + "\n"};
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
    const auto oFound = moPlaces.find(Normalise(key));
    if (oFound == moPlaces.end())
        return;
    for (const std::size_t nPlace : oFound->second)
        moEntries[nPlace] = {};
    moPlaces.erase(oFound);
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
