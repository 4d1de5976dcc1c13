#include "plugins/jp2/geo/geotiffbox.h"

#include "plugins/support/file/numbers.h"

#include <bit>
#include <cstring>
#include <string>

namespace krv::plugins::jp2
{

namespace
{

using support::AppendNumber;
using support::ReadNumber;

constexpr std::uint16_t TYPE_ASCII = 2;
constexpr std::uint16_t TYPE_SHORT = 3;
constexpr std::uint16_t TYPE_LONG = 4;
constexpr std::uint16_t TYPE_DOUBLE = 12;
constexpr std::size_t ENTRY_BYTES = 12;
constexpr std::size_t HEADER_BYTES = 8;
constexpr std::size_t MOST_VALUES = 65535;

std::size_t GetTypeBytes(std::uint16_t nType)
{
    return nType == TYPE_ASCII ? 1 : nType == TYPE_SHORT ? 2 : nType == TYPE_LONG ? 4 : nType == TYPE_DOUBLE ? 8 : 0;
}

// The values of an entry of a directory; none when they are of another type or outside.
class Entry
{
public:
    Entry(const std::vector<unsigned char>& oBytes, std::size_t nPlace, bool bBigEndian)
        : moBytes(oBytes), mbBigEndian(bBigEndian)
    {
        mnTag = static_cast<std::uint16_t>(Number(nPlace, 2));
        mnType = static_cast<std::uint16_t>(Number(nPlace + 2, 2));
        const std::uint64_t nCount = Number(nPlace + 4, 4);
        const std::uint64_t nBytes = nCount * GetTypeBytes(mnType);
        const std::uint64_t nFrom = nBytes <= 4 ? nPlace + 8 : Number(nPlace + 8, 4);
        if (nCount > MOST_VALUES || nFrom + nBytes > oBytes.size())
            return;
        mnCount = static_cast<std::size_t>(nCount);
        mnFrom = static_cast<std::size_t>(nFrom);
    }

    std::uint16_t GetTag() const { return mnTag; }

    std::vector<double> GetDoubles() const
    {
        std::vector<double> oValues;
        for (std::size_t nAt = 0; mnType == TYPE_DOUBLE && nAt < mnCount; ++nAt)
            oValues.push_back(std::bit_cast<double>(Number(mnFrom + 8 * nAt, 8)));
        return oValues;
    }

    std::vector<std::uint16_t> GetShorts() const
    {
        std::vector<std::uint16_t> oValues;
        for (std::size_t nAt = 0; mnType == TYPE_SHORT && nAt < mnCount; ++nAt)
            oValues.push_back(static_cast<std::uint16_t>(Number(mnFrom + 2 * nAt, 2)));
        return oValues;
    }

    std::string GetText() const
    {
        const auto* pText = reinterpret_cast<const char*>(moBytes.data() + mnFrom);
        return mnType == TYPE_ASCII ? std::string(pText, strnlen(pText, mnCount)) : std::string();
    }

private:
    std::uint64_t Number(std::size_t nPlace, std::size_t nBytes) const
    {
        return ReadNumber(moBytes.data() + nPlace, nBytes, mbBigEndian);
    }

    const std::vector<unsigned char>& moBytes;
    bool mbBigEndian;
    std::uint16_t mnTag = 0;
    std::uint16_t mnType = 0;
    std::size_t mnCount = 0;
    std::size_t mnFrom = 0;
};

// A directory on its way: entries, and the values that do not fit them.
class Directory
{
public:
    explicit Directory(std::size_t nEntries) : mnValues(HEADER_BYTES + 2 + nEntries * ENTRY_BYTES + 4)
    {
        AppendNumber(moEntries, nEntries, 2, false);
    }

    void Add(std::uint16_t nTag, std::uint16_t nType, std::size_t nCount, std::vector<unsigned char> oValues)
    {
        AppendNumber(moEntries, nTag, 2, false);
        AppendNumber(moEntries, nType, 2, false);
        AppendNumber(moEntries, nCount, 4, false);
        if (oValues.size() <= 4)
        {
            oValues.resize(4);
            moEntries.insert(moEntries.end(), oValues.begin(), oValues.end());
            return;
        }
        AppendNumber(moEntries, mnValues + moValues.size(), 4, false);
        oValues.resize((oValues.size() + 1) / 2 * 2);
        moValues.insert(moValues.end(), oValues.begin(), oValues.end());
    }

    void AddShort(std::uint16_t nTag, std::uint16_t nValue) { Add(nTag, TYPE_SHORT, 1, Bytes(nValue, 2)); }

    void AddDoubles(std::uint16_t nTag, const std::vector<double>& oNumbers)
    {
        std::vector<unsigned char> oValues;
        for (const double nNumber : oNumbers)
            AppendNumber(oValues, std::bit_cast<std::uint64_t>(nNumber), 8, false);
        if (!oNumbers.empty())
            Add(nTag, TYPE_DOUBLE, oNumbers.size(), std::move(oValues));
    }

    static std::vector<unsigned char> Bytes(std::uint64_t nValue, std::size_t nBytes)
    {
        std::vector<unsigned char> oBytes;
        AppendNumber(oBytes, nValue, nBytes, false);
        return oBytes;
    }

    std::vector<unsigned char> Finish() const
    {
        std::vector<unsigned char> oFile = {'I', 'I', 42, 0, HEADER_BYTES, 0, 0, 0};
        oFile.insert(oFile.end(), moEntries.begin(), moEntries.end());
        AppendNumber(oFile, 0, 4, false);
        oFile.insert(oFile.end(), moValues.begin(), moValues.end());
        return oFile;
    }

private:
    std::size_t mnValues; // where they begin
    std::vector<unsigned char> moEntries;
    std::vector<unsigned char> moValues;
};

} // namespace

support::GeoTags ParseGeoTiff(const std::vector<unsigned char>& oBytes)
{
    support::GeoTags oTags;
    if (oBytes.size() < HEADER_BYTES || oBytes[0] != oBytes[1] || (oBytes[0] != 'I' && oBytes[0] != 'M'))
        return oTags;
    const bool bBigEndian = oBytes[0] == 'M';
    const std::uint64_t nDirectory = ReadNumber(oBytes.data() + 4, 4, bBigEndian);
    if (ReadNumber(oBytes.data() + 2, 2, bBigEndian) != 42 || nDirectory + 2 > oBytes.size())
        return oTags;
    const std::uint64_t nEntries = ReadNumber(oBytes.data() + nDirectory, 2, bBigEndian);
    for (std::uint64_t nAt = 0; nAt < nEntries; ++nAt)
    {
        const std::uint64_t nPlace = nDirectory + 2 + nAt * ENTRY_BYTES;
        if (nPlace + ENTRY_BYTES > oBytes.size())
            break;
        const Entry oEntry(oBytes, static_cast<std::size_t>(nPlace), bBigEndian);
        switch (oEntry.GetTag())
        {
        case support::TAG_GEO_SCALE:
            oTags.moScale = oEntry.GetDoubles();
            break;
        case support::TAG_GEO_TIE_POINTS:
            oTags.moTiePoints = oEntry.GetDoubles();
            break;
        case support::TAG_GEO_MATRIX:
            oTags.moMatrix = oEntry.GetDoubles();
            break;
        case support::TAG_GEO_KEYS:
            oTags.moKeys = oEntry.GetShorts();
            break;
        case support::TAG_GEO_DOUBLES:
            oTags.moDoubles = oEntry.GetDoubles();
            break;
        case support::TAG_GEO_TEXTS:
            oTags.moTexts = oEntry.GetText();
            break;
        default:
            break;
        }
    }
    return oTags;
}

std::vector<unsigned char> MakeGeoTiff(const support::GeoTags& oTags)
{
    // One pixel of one byte, which stands in the place of the entry that says where it is.
    constexpr std::uint16_t PIXEL = 8;
    std::size_t nEntries = 9;
    for (const auto* pValues : {&oTags.moScale, &oTags.moTiePoints, &oTags.moMatrix, &oTags.moDoubles})
        nEntries += pValues->empty() ? 0 : 1;
    nEntries += (oTags.moKeys.empty() ? 0 : 1) + (oTags.moTexts.empty() ? 0 : 1);
    Directory oDirectory(nEntries);
    oDirectory.AddShort(256, 1); // width
    oDirectory.AddShort(257, 1); // height
    oDirectory.AddShort(258, 8); // bits
    oDirectory.AddShort(259, 1); // not compressed
    oDirectory.AddShort(262, 1); // black is zero
    oDirectory.Add(273, TYPE_LONG, 1, Directory::Bytes(PIXEL, 4));
    oDirectory.AddShort(277, 1); // one sample
    oDirectory.AddShort(278, 1); // one row
    oDirectory.Add(279, TYPE_LONG, 1, Directory::Bytes(1, 4));
    oDirectory.AddDoubles(support::TAG_GEO_SCALE, oTags.moScale);
    oDirectory.AddDoubles(support::TAG_GEO_TIE_POINTS, oTags.moTiePoints);
    oDirectory.AddDoubles(support::TAG_GEO_MATRIX, oTags.moMatrix);
    std::vector<unsigned char> oKeys;
    for (const std::uint16_t nKey : oTags.moKeys)
        AppendNumber(oKeys, nKey, 2, false);
    if (!oKeys.empty())
        oDirectory.Add(support::TAG_GEO_KEYS, TYPE_SHORT, oTags.moKeys.size(), std::move(oKeys));
    oDirectory.AddDoubles(support::TAG_GEO_DOUBLES, oTags.moDoubles);
    std::vector<unsigned char> oTexts(oTags.moTexts.begin(), oTags.moTexts.end());
    oTexts.push_back(0);
    if (!oTags.moTexts.empty())
        oDirectory.Add(support::TAG_GEO_TEXTS, TYPE_ASCII, oTags.moTexts.size() + 1, std::move(oTexts));
    return oDirectory.Finish();
}

} // namespace krv::plugins::jp2
