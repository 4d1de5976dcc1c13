#include "plugins/tif/geo/geokeydirectory.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/xml/xmlutil.h"

#include <algorithm>
#include <new>
#include <string_view>
#include <utility>

#include <geo_simpletags.h>
#include <geo_tiffp.h>

namespace krv::plugins::tif
{
namespace
{

constexpr std::size_t ENTRY_VALUES = 4; // of a key in the directory: key, location, count, value or offset
constexpr std::uint16_t PIXEL_IS_POINT = 2;

struct Entry
{
    std::uint16_t key;
    std::uint16_t location;
    std::uint16_t count;
    std::uint16_t value;
};

// A tag of the type; how its count is handed out depends on who made the tag known.
bool FetchTag(TIFF* poFile, std::uint32_t nTag, TIFFDataType eType, std::size_t& nCount, const void*& poData)
{
    const TIFFField* poField = TIFFFindField(poFile, nTag, TIFF_ANY);
    if (poField == nullptr || TIFFFieldDataType(poField) != eType || TIFFFieldPassCount(poField) == 0)
        return false;
    std::uint32_t nLong = 0;
    std::uint16_t nShort = 0;
    void* poValue = nullptr;
    const bool bLong = TIFFFieldReadCount(poField) == TIFF_VARIABLE2;
    const int nFound =
        bLong ? TIFFGetField(poFile, nTag, &nLong, &poValue) : TIFFGetField(poFile, nTag, &nShort, &poValue);
    nCount = bLong ? nLong : nShort;
    poData = poValue;
    return nFound == 1 && poValue != nullptr && nCount > 0;
}

template <class Value>
std::vector<Value> ReadTag(TIFF* poFile, std::uint32_t nTag, TIFFDataType eType)
{
    std::size_t nCount = 0;
    const void* poData = nullptr;
    if (!FetchTag(poFile, nTag, eType, nCount, poData))
        return {};
    const auto* poFirst = static_cast<const Value*>(poData);
    return std::vector<Value>(poFirst, poFirst + nCount);
}

std::string ReadAscii(TIFF* poFile, std::uint32_t nTag)
{
    const TIFFField* poField = TIFFFindField(poFile, nTag, TIFF_ANY);
    if (poField == nullptr || TIFFFieldDataType(poField) != TIFF_ASCII)
        return {};
    std::size_t nCount = 0;
    const void* poData = nullptr;
    if (FetchTag(poFile, nTag, TIFF_ASCII, nCount, poData))
        return std::string(static_cast<const char*>(poData), nCount);
    const char* poText = nullptr;
    const bool bFound = TIFFFieldPassCount(poField) == 0 && TIFFGetField(poFile, nTag, &poText) == 1;
    return bFound && poText != nullptr ? std::string(poText) : std::string();
}

std::vector<Entry> ReadEntries(const std::vector<std::uint16_t>& oDirectory)
{
    std::vector<Entry> oEntries;
    for (std::size_t nAt = ENTRY_VALUES; nAt + ENTRY_VALUES <= oDirectory.size(); nAt += ENTRY_VALUES)
        oEntries.push_back({oDirectory[nAt], oDirectory[nAt + 1], oDirectory[nAt + 2], oDirectory[nAt + 3]});
    return oEntries;
}

std::vector<std::uint16_t> ToDirectory(const std::vector<std::uint16_t>& oHeader, const std::vector<Entry>& oEntries)
{
    std::vector<std::uint16_t> oDirectory(oHeader.begin(), oHeader.begin() + ENTRY_VALUES - 1);
    oDirectory.push_back(static_cast<std::uint16_t>(oEntries.size()));
    for (const Entry& oEntry : oEntries)
        oDirectory.insert(oDirectory.end(), {oEntry.key, oEntry.location, oEntry.count, oEntry.value});
    return oDirectory;
}

[[noreturn]] void ThrowDamaged(const std::string& cause)
{
    throw DataException("The geographic keys are damaged: " + cause);
}

extern "C" void IgnoreMessage(GTIF*, int, const char*, ...) {}

bool FitsInto(const Entry& oEntry, std::size_t nValues)
{
    return std::size_t{oEntry.value} + oEntry.count <= nValues;
}

} // namespace

std::vector<double> ReadDoubles(TIFF* poFile, std::uint32_t nTag)
{
    return ReadTag<double>(poFile, nTag, TIFF_DOUBLE);
}

std::vector<std::uint16_t> ReadShorts(TIFF* poFile, std::uint32_t nTag)
{
    return ReadTag<std::uint16_t>(poFile, nTag, TIFF_SHORT);
}

bool IsPixelPoint(TIFF* poFile)
{
    for (const Entry& oEntry : ReadEntries(ReadShorts(poFile, TIFFTAG_GEOKEYDIRECTORY)))
        if (oEntry.key == GTRasterTypeGeoKey && oEntry.location == 0 && oEntry.count == 1)
            return oEntry.value == PIXEL_IS_POINT;
    return false;
}

// The tags of the keys as the library for them takes them, without the file.
struct GeoKeyDirectory::Tags
{
    std::vector<std::uint16_t> directory;
    std::vector<double> doubles;
    std::string ascii;
    ST_TIFF* store = nullptr;

    Tags() = default;
    Tags(const Tags&) = delete;
    Tags& operator=(const Tags&) = delete;
    ~Tags()
    {
        if (store != nullptr)
            ST_Destroy(store);
    }

    bool Accept(Entry& oEntry) const;
    void Check();
    void Store();
};

// False for what can be left out without changing the system: texts, and keys whose values stand in unknown places.
bool GeoKeyDirectory::Tags::Accept(Entry& oEntry) const
{
    const std::string key = "key " + std::to_string(oEntry.key);
    switch (oEntry.location)
    {
    case 0:
        if (oEntry.count != 1)
            ThrowDamaged(key + " has " + std::to_string(oEntry.count) + " values in the place of one");
        return true;
    case TIFFTAG_GEODOUBLEPARAMS:
        if (!FitsInto(oEntry, doubles.size()) || oEntry.count == 0)
            ThrowDamaged(key + " points outside the list of numbers");
        return true;
    case TIFFTAG_GEOKEYDIRECTORY:
        if (!FitsInto(oEntry, directory.size()) || oEntry.count == 0)
            ThrowDamaged(key + " points outside the directory");
        return true;
    case TIFFTAG_GEOASCIIPARAMS:
        if (oEntry.value >= ascii.size())
            return false;
        oEntry.count = static_cast<std::uint16_t>(std::min<std::size_t>(oEntry.count, ascii.size() - oEntry.value));
        return oEntry.count > 0;
    default:
        return false;
    }
}

void GeoKeyDirectory::Tags::Check()
{
    if (directory.size() < ENTRY_VALUES)
        ThrowDamaged("the directory is too short");
    if (directory[0] != 1)
        ThrowDamaged("version " + std::to_string(directory[0]) + " is not known");
    std::vector<Entry> oEntries = ReadEntries(directory);
    if (directory[3] > oEntries.size())
        ThrowDamaged(std::to_string(directory[3]) + " keys are announced, " + std::to_string(oEntries.size()) +
                     " found");
    oEntries.resize(directory[3]);
    std::vector<Entry> oGood;
    for (Entry& oEntry : oEntries)
        if (Accept(oEntry))
            oGood.push_back(oEntry);
    // Values behind the entries keep their offsets: only the number of entries shrinks when some are left out.
    const std::vector<std::uint16_t> oChecked = ToDirectory(directory, oGood);
    std::copy(oChecked.begin(), oChecked.end(), directory.begin());
}

void GeoKeyDirectory::Tags::Store()
{
    store = ST_Create();
    if (store == nullptr)
        throw std::bad_alloc();
    ST_SetKey(store, TIFFTAG_GEOKEYDIRECTORY, static_cast<int>(directory.size()), STT_SHORT, directory.data());
    if (!doubles.empty())
        ST_SetKey(store, TIFFTAG_GEODOUBLEPARAMS, static_cast<int>(doubles.size()), STT_DOUBLE, doubles.data());
    if (!ascii.empty())
        ST_SetKey(store, TIFFTAG_GEOASCIIPARAMS, static_cast<int>(ascii.size() + 1), STT_ASCII, ascii.data());
}

std::unique_ptr<GeoKeyDirectory> GeoKeyDirectory::Read(TIFF* poFile)
{
    constexpr std::size_t MAX_VALUES = 0xFFFF; // offsets have 16 bits
    auto poTags = std::make_unique<Tags>();
    poTags->directory = ReadShorts(poFile, TIFFTAG_GEOKEYDIRECTORY);
    if (poTags->directory.empty())
        return nullptr;
    poTags->doubles = ReadDoubles(poFile, TIFFTAG_GEODOUBLEPARAMS);
    poTags->ascii = ReadAscii(poFile, TIFFTAG_GEOASCIIPARAMS);
    if (poTags->directory.size() > MAX_VALUES || poTags->doubles.size() > 2 * MAX_VALUES)
        ThrowDamaged("the directory is too long");
    poTags->ascii.resize(std::min(poTags->ascii.size(), 2 * MAX_VALUES));
    poTags->Check();
    poTags->Store();
    return std::unique_ptr<GeoKeyDirectory>(new GeoKeyDirectory(std::move(poTags)));
}

GeoKeyDirectory::GeoKeyDirectory(std::unique_ptr<Tags> poTags) : mpoTags(std::move(poTags)), mpoKeys(nullptr)
{
    TIFFMethod_t oMethods = {};
    GTIFSetSimpleTagsMethods(&oMethods);
    mpoKeys = GTIFNewWithMethodsEx(mpoTags->store, &oMethods, &IgnoreMessage, nullptr);
    if (mpoKeys == nullptr)
        ThrowDamaged("they cannot be read");
}

GeoKeyDirectory::~GeoKeyDirectory()
{
    GTIFFree(mpoKeys);
}

int GeoKeyDirectory::GetCode(geokey_t eKey) const
{
    unsigned short nCode = 0;
    return GTIFKeyGetSHORT(mpoKeys, eKey, &nCode, 0, 1) == 1 ? nCode : 0;
}

bool GeoKeyDirectory::HasCode(geokey_t eKey) const
{
    const int nCode = GetCode(eKey);
    return nCode != KvUndefined && nCode != KvUserDefined;
}

std::vector<double> GeoKeyDirectory::GetNumbers(geokey_t eKey) const
{
    tagtype_t eType = TYPE_UNKNOWN;
    int nSize = 0;
    const int nCount = GTIFKeyInfo(mpoKeys, eKey, &nSize, &eType);
    if (nCount > 0 && eType == TYPE_SHORT)
        return {static_cast<double>(GetCode(eKey))};
    if (nCount <= 0 || eType != TYPE_DOUBLE)
        return {};
    std::vector<double> oNumbers(static_cast<std::size_t>(nCount));
    if (GTIFKeyGetDOUBLE(mpoKeys, eKey, oNumbers.data(), 0, nCount) != nCount)
        return {};
    return oNumbers;
}

std::optional<double> GeoKeyDirectory::GetNumber(geokey_t eKey) const
{
    const std::vector<double> oNumbers = GetNumbers(eKey);
    return oNumbers.empty() ? std::nullopt : std::optional<double>(oNumbers.front());
}

std::string GeoKeyDirectory::GetText(geokey_t eKey) const
{
    constexpr std::string_view SEPARATORS(" \t\r\n|\0", 6);
    tagtype_t eType = TYPE_UNKNOWN;
    int nSize = 0;
    const int nCount = GTIFKeyInfo(mpoKeys, eKey, &nSize, &eType);
    if (nCount <= 0 || eType != TYPE_ASCII)
        return {};
    std::string text(static_cast<std::size_t>(nCount) + 1, '\0');
    if (GTIFKeyGetASCII(mpoKeys, eKey, text.data(), static_cast<int>(text.size())) == 0)
        return {};
    const auto nFirst = text.find_first_not_of(SEPARATORS);
    if (nFirst == std::string::npos)
        return {};
    text = text.substr(nFirst, text.find_last_not_of(SEPARATORS) - nFirst + 1);
    const std::basic_string<XMLCh> wide = XmlTranscode(text); // bytes that are no UTF-8 become replacement characters
    return XmlTranscode(wide.data(), wide.size());
}

} // namespace krv::plugins::tif
