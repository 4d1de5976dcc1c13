#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace krv::fuzz
{

// The bytes of a small TIFF file of one 8-bit channel, 4 x 4 pixels, that holds any tags with any contents.
class RawTiff
{
public:
    enum Type : std::uint16_t
    {
        eText = 2,
        eShort = 3,
        eLong = 4,
        eDouble = 12
    };

    RawTiff();

    // Tags in any order, a number once. A value that is not whole is cut off.
    void Add(std::uint16_t nTag, Type eType, const std::string& bytes);

    std::string GetBytes() const;

private:
    struct Entry
    {
        std::uint16_t mnTag;
        Type meType;
        std::string moBytes;
    };

    void AddNumber(std::uint16_t nTag, std::uint32_t nValue);

    std::vector<Entry> moEntries;
};

} // namespace krv::fuzz
