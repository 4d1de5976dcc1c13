#include "fuzz/support/rawtiff.h"

#include <algorithm>

namespace krv::fuzz
{

namespace
{

constexpr std::size_t PIXEL_BYTES = 16;
constexpr std::size_t HEADER_BYTES = 8;
constexpr std::size_t ENTRY_BYTES = 12;

std::size_t ValueBytes(RawTiff::Type eType)
{
    switch (eType)
    {
    case RawTiff::eShort:
        return 2;
    case RawTiff::eLong:
        return 4;
    case RawTiff::eDouble:
        return 8;
    default:
        return 1;
    }
}

void Append(std::string& oBytes, std::uint64_t nValue, unsigned int nCount)
{
    for (unsigned int n = 0; n < nCount; ++n)
        oBytes += static_cast<char>(nValue >> (8 * n));
}

} // namespace

RawTiff::RawTiff()
{
    AddNumber(256, 4);                                        // width
    AddNumber(257, 4);                                        // height
    AddNumber(258, 8);                                        // bits
    AddNumber(259, 1);                                        // not compressed
    AddNumber(262, 1);                                        // grey
    AddNumber(273, static_cast<std::uint32_t>(HEADER_BYTES)); // where the strip is
    AddNumber(277, 1);                                        // channels
    AddNumber(278, 4);                                        // rows of a strip
    AddNumber(279, static_cast<std::uint32_t>(PIXEL_BYTES));  // bytes of a strip
}

void RawTiff::AddNumber(std::uint16_t nTag, std::uint32_t nValue)
{
    std::string bytes;
    Append(bytes, nValue, 4);
    Add(nTag, eLong, bytes);
}

void RawTiff::Add(std::uint16_t nTag, Type eType, const std::string& bytes)
{
    moEntries.push_back({nTag, eType, bytes.substr(0, bytes.size() / ValueBytes(eType) * ValueBytes(eType))});
}

std::string RawTiff::GetBytes() const
{
    std::vector<Entry> oEntries = moEntries;
    std::sort(oEntries.begin(), oEntries.end(), [](const auto& a, const auto& b) { return a.mnTag < b.mnTag; });
    std::string file = "II";
    Append(file, 42, 2);
    Append(file, HEADER_BYTES + PIXEL_BYTES, 4);
    file.append(PIXEL_BYTES, '\x55');
    Append(file, oEntries.size(), 2);
    std::size_t nFree = file.size() + oEntries.size() * ENTRY_BYTES + 4;
    std::string values;
    for (const Entry& oEntry : oEntries)
    {
        Append(file, oEntry.mnTag, 2);
        Append(file, oEntry.meType, 2);
        Append(file, oEntry.moBytes.size() / ValueBytes(oEntry.meType), 4);
        if (oEntry.moBytes.size() <= 4)
        {
            file += oEntry.moBytes + std::string(4 - oEntry.moBytes.size(), '\0');
            continue;
        }
        Append(file, nFree + values.size(), 4);
        values += oEntry.moBytes;
    }
    Append(file, 0, 4);
    return file + values;
}

} // namespace krv::fuzz
