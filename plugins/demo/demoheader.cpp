#include "plugins/demo/demoheader.h"

#include "gobs/raster/datatypeadapter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <charconv>
#include <limits>
#include <sstream>

namespace krv::plugins::demo
{

namespace
{

constexpr std::string_view HEX = "0123456789ABCDEF";

krv::gobs::DataType ParseType(const std::string& type, const std::string& fileName)
{
    for (int nCode = krv::gobs::eDT_8U; nCode <= krv::gobs::eDT_C64R; ++nCode)
    {
        const auto eType = static_cast<krv::gobs::NativeDataTypeCode>(nCode);
        if (krv::gobs::DataTypeAdapter::TypeToString(eType) == type)
            return eType;
    }
    throw krv::FileFormatException(fileName, fileName + " has channels of the unknown type " + type);
}

std::string Encode(std::string_view text, std::string_view special)
{
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

void ParseTag(std::string_view line, krv::datasources::AuxiliaryData& oTags)
{
    const std::size_t nEqual = line.find('=');
    if (nEqual == std::string_view::npos)
        return;
    std::string_view key = line.substr(0, nEqual);
    const std::string value = Decode(line.substr(nEqual + 1));
    unsigned int nChannel = 0;
    const char* const pEnd = key.data() + key.size();
    const char* const pBracket = key.starts_with('[') ? std::from_chars(key.data() + 1, pEnd, nChannel).ptr : pEnd;
    if (pBracket == pEnd || *pBracket != ']' || nChannel == 0 || nChannel > oTags.GetChannelCount())
        return oTags.SetFileMetadataValue(Decode(key), value);
    key.remove_prefix(static_cast<std::size_t>(pBracket - key.data()) + 1);
    if (key.empty())
        oTags.SetChannelDescription(value, nChannel);
    else
        oTags.SetChanMetadataValue(Decode(key), value, nChannel);
}

void AppendTags(std::string& text, const std::string& prefix, const krv::datasources::MetadataMap& oTags)
{
    for (const auto& [key, value] : oTags)
        text += prefix + EncodeKey(key) + "=" + Encode(value, "%") + "\n";
}

} // namespace

DemoHeader DemoHeader::Parse(const std::string& fileName, const std::string& bytes, std::uint64_t& nLength)
{
    if (bytes.starts_with(UNFINISHED))
        throw krv::FileFormatException(fileName, fileName + " was not written to its end");
    const std::size_t nEnd = bytes.find("\n\n");
    if (!bytes.starts_with(SIGNATURE) || nEnd == std::string::npos)
        throw krv::FileFormatException(fileName, fileName + " has no complete header");
    nLength = nEnd + 2;

    std::istringstream oLines(bytes.substr(SIGNATURE.size(), nEnd - SIGNATURE.size() + 1));
    oLines.imbue(std::locale::classic());
    long long nWidth = 0; // every number from a file is hostile: read wide and signed, then checked
    long long nHeight = 0;
    std::string line;
    std::getline(oLines >> nWidth >> nHeight >> std::ws, line);
    if (std::min(nWidth, nHeight) < 1 || std::max(nWidth, nHeight) > std::numeric_limits<int>::max() || line.empty())
        throw krv::FileFormatException(fileName, fileName + " has no valid image size or no channels");

    DemoHeader oHeader;
    oHeader.mnWidth = static_cast<unsigned int>(nWidth);
    oHeader.mnHeight = static_cast<unsigned int>(nHeight);
    std::istringstream oTypes(line);
    for (std::string type; oTypes >> type;)
        oHeader.moTypes.push_back(ParseType(type, fileName));
    oHeader.moTags = krv::datasources::AuxiliaryData(static_cast<unsigned int>(oHeader.moTypes.size()));
    while (std::getline(oLines, line))
        ParseTag(line, oHeader.moTags);
    return oHeader;
}

std::string DemoHeader::ToText(const std::string& fileName) const
{
    std::string text(SIGNATURE);
    text += std::to_string(mnWidth) + " " + std::to_string(mnHeight) + "\n";
    for (const krv::gobs::DataType& oType : moTypes)
        text += oType.Describe() + " ";
    text.back() = '\n';
    AppendTags(text, "", moTags.GetFileMetadata());
    for (unsigned int nChannel = 1; nChannel <= moTypes.size(); ++nChannel)
    {
        const std::string prefix = "[" + std::to_string(nChannel) + "]";
        const std::string description = moTags.GetChannelDescription(nChannel);
        if (!description.empty())
            text += prefix + "=" + Encode(description, "%") + "\n";
        AppendTags(text, prefix, moTags.GetChanMetadata(nChannel));
    }
    if (text.size() > MAX_BYTES - 3)
        throw krv::DataException(fileName + ": channels and metadata take " + std::to_string(text.size()) +
                                 " bytes, more than the " + std::to_string(MAX_BYTES) + " of a header");
    text.append(MAX_BYTES - 2 - text.size(), ' ');
    return text + "\n\n";
}

std::uint64_t DemoHeader::GetPixelBytes() const
{
    std::uint64_t nBytes = 0;
    for (const krv::gobs::DataType& oType : moTypes)
    {
        nBytes += krv::gobs::BufferBytes(mnWidth, mnHeight, 1, oType);
        if (nBytes > INT64_MAX - MAX_BYTES)
            throw krv::DataException("The image of " + std::to_string(mnWidth) + " x " + std::to_string(mnHeight) +
                                     " pixels and " + std::to_string(moTypes.size()) + " channels is too large");
    }
    return nBytes;
}

} // namespace krv::plugins::demo
