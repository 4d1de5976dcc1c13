#include "plugins/support/writing/recordtext.h"

#include "toolkit/core/numbertext.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <charconv>
#include <sstream>
#include <string_view>

namespace krv::plugins::support
{

namespace
{

const std::string CRS = "crs";
const std::string GEOCODING = "geocoding";
const std::string LEVEL = "level ";

std::string Encode(std::string_view text, std::string_view special)
{
    constexpr std::string_view HEX = "0123456789ABCDEF";
    std::string encoded;
    for (const char c : text)
    {
        const auto nByte = static_cast<unsigned char>(c);
        if (nByte >= ' ' && nByte != 127 && special.find(c) == std::string_view::npos)
            encoded += c;
        else
            encoded += {'%', HEX[nByte / 16], HEX[nByte % 16]};
    }
    return encoded;
}

std::string EncodeKey(const std::string& key)
{
    const std::string encoded = Encode(key, "%=");
    return encoded.starts_with('[') ? "%5B" + encoded.substr(1) : encoded;
}

std::string Decode(std::string_view text)
{
    std::string decoded;
    for (std::size_t i = 0; i < text.size(); ++i)
    {
        unsigned char nByte = 0;
        const char* const pEnd = text.data() + std::min(i + 3, text.size());
        if (text[i] != '%' || std::from_chars(text.data() + i + 1, pEnd, nByte, 16).ptr != text.data() + i + 3)
        {
            decoded += text[i];
            continue;
        }
        decoded += static_cast<char>(nByte);
        i += 2;
    }
    return decoded;
}

std::string WriteTags(const std::string& prefix, const krv::datasources::MetadataMap& oTags)
{
    std::string text;
    for (const auto& [key, value] : oTags)
        text += prefix + EncodeKey(key) + "=" + Encode(value, "%") + "\n";
    return text;
}

} // namespace

void RecordText::ReadOwn(const std::string& name, const std::string& value)
{
    const auto oLevel = krv::ParseNumber<unsigned int>(name.substr(std::min(name.size(), LEVEL.size())));
    const auto oPlace = krv::ParseNumber<std::uint64_t>(value);
    if (!name.starts_with(LEVEL))
        moOwn[name] = value;
    else if (oLevel && oPlace && *oLevel > 1)
        moLevels[*oLevel] = *oPlace;
}

void RecordText::Read(std::istream& oLines)
{
    for (std::string line; std::getline(oLines, line);)
    {
        const std::size_t nSign = line.find('='), nEnd = line.find(']');
        if (nSign == std::string::npos)
            continue;
        const std::string value = Decode(std::string_view(line).substr(nSign + 1));
        if (!line.starts_with('[') || nEnd > nSign)
        {
            moTags.SetFileMetadataValue(Decode(line.substr(0, nSign)), value);
            continue;
        }
        const std::string key = Decode(line.substr(nEnd + 1, nSign - nEnd - 1));
        const std::string name = line.substr(1, nEnd - 1);
        const unsigned int nChannel = krv::ParseNumber<unsigned int>(name).value_or(0);
        if (nChannel == 0 || nChannel > moTags.GetChannelCount())
            ReadOwn(name, value);
        else if (key.empty())
            moTags.SetChannelDescription(value, nChannel);
        else
            moTags.SetChanMetadataValue(key, value, nChannel);
    }
}

std::string RecordText::Write() const
{
    std::string text = WriteTags("", moTags.GetFileMetadata());
    for (unsigned int nChannel = 1; nChannel <= moTags.GetChannelCount(); ++nChannel)
    {
        const std::string prefix = "[" + std::to_string(nChannel) + "]";
        const std::string description = moTags.GetChannelDescription(nChannel);
        if (!description.empty())
            text += prefix + "=" + Encode(description, "%") + "\n";
        text += WriteTags(prefix, moTags.GetChanMetadata(nChannel));
    }
    for (const auto& [name, value] : moOwn)
        text += "[" + name + "]=" + Encode(value, "%") + "\n";
    for (const auto& [nLevel, nPlace] : moLevels)
        text += "[" + LEVEL + std::to_string(nLevel) + "]=" + std::to_string(nPlace) + "\n";
    return text;
}

std::unique_ptr<krv::ogc::cs::ICRS> RecordText::GetCRS() const
{
    const auto oFound = moOwn.find(CRS);
    return oFound == moOwn.end() ? nullptr : krv::ogc::cs::CreateCRSFromWKT(oFound->second);
}

void RecordText::SetCRS(const krv::ogc::cs::ICRS& oCRS)
{
    SetDefinition(oCRS.GetWKT());
}

std::string RecordText::GetDefinition() const
{
    const auto oFound = moOwn.find(CRS);
    return oFound == moOwn.end() ? std::string() : oFound->second;
}

void RecordText::SetDefinition(const std::string& definition)
{
    moOwn[CRS] = definition;
}

bool RecordText::HasGeocoding() const
{
    return moOwn.contains(GEOCODING);
}

krv::ogc::cs::GeocodingInfo RecordText::GetGeocoding() const
{
    const auto oFound = moOwn.find(GEOCODING);
    std::istringstream oText(oFound == moOwn.end() ? std::string() : oFound->second);
    oText.imbue(std::locale::classic());
    std::array<double, 6> oTerms{};
    for (double& nTerm : oTerms)
        oText >> nTerm;
    const krv::ogc::cs::GeocodingInfo oInfo(oTerms[0], oTerms[1], oTerms[2], oTerms[3], oTerms[4], oTerms[5]);
    return oText && oInfo.IsInvertible() ? oInfo : krv::ogc::cs::GeocodingInfo();
}

void RecordText::RemoveCRS()
{
    moOwn.erase(CRS);
}

void RecordText::RemoveGeocoding()
{
    moOwn.erase(GEOCODING);
}

void RecordText::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    std::string& text = moOwn[GEOCODING];
    text.clear();
    for (const double nTerm : oInfo.GetTerms())
        text += krv::NumberText(nTerm) + " ";
}

} // namespace krv::plugins::support
