#include "plugins/jp2/reading/boxes.h"

#include "plugins/support/file/numbers.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstring>

namespace krv::plugins::jp2
{

namespace
{

using support::ReadNumber;

constexpr std::size_t MOST_BOXES = 65536;
constexpr unsigned char SIGNATURE[] = {0, 0, 0, 12, 'j', 'P', ' ', ' ', 13, 10, 0x87, 10};

} // namespace

std::vector<Box> ListBoxes(const support::File& oFile, std::uint64_t nBegin, std::uint64_t nEnd, std::string* pTrouble)
{
    std::vector<Box> oBoxes;
    const auto Stop = [&](const std::string& trouble)
    {
        if (pTrouble != nullptr)
            *pTrouble = trouble + " at offset " + std::to_string(nBegin);
        return oBoxes;
    };
    while (nBegin < nEnd)
    {
        unsigned char aHeader[16] = {};
        const std::size_t nRead =
            oFile.ReadUpTo(nBegin, aHeader, static_cast<std::size_t>(std::min<std::uint64_t>(16, nEnd - nBegin)));
        if (nRead < 8)
            return Stop("there is no whole box");
        std::uint64_t nBytes = ReadNumber(aHeader, 4, true);
        std::uint64_t nHeader = 8;
        if (nBytes == 1)
        {
            if (nRead < 16)
                return Stop("there is no whole box");
            nBytes = ReadNumber(aHeader + 8, 8, true);
            nHeader = 16;
        }
        else if (nBytes == 0)
            nBytes = nEnd - nBegin;
        if (nBytes < nHeader || oBoxes.size() == MOST_BOXES)
            return Stop("there is a box of no valid length");
        const std::uint64_t nLeft = nEnd - nBegin;
        oBoxes.push_back({static_cast<std::uint32_t>(ReadNumber(aHeader + 4, 4, true)), nBegin + nHeader,
                          std::min(nBytes, nLeft) - nHeader, nBytes <= nLeft});
        nBegin += std::min(nBytes, nLeft);
    }
    return oBoxes;
}

std::vector<unsigned char> ReadBox(const support::File& oFile, const Box& oBox, std::uint64_t nMost)
{
    if (!oBox.mbWhole || oBox.mnBytes > nMost)
        throw krv::FileFormatException(oFile.GetName(), oFile.GetName() + ": the box at offset " +
                                                            std::to_string(oBox.mnOffset) +
                                                            (oBox.mbWhole ? " is too large" : " is truncated"));
    std::vector<unsigned char> oBytes(static_cast<std::size_t>(oBox.mnBytes));
    oFile.Read(oBox.mnOffset, oBytes.data(), oBytes.size());
    return oBytes;
}

bool IsCodestream(const unsigned char* pBytes, std::size_t nBytes)
{
    // SOC, SIZ, and a length of SIZ for at least one component.
    return nBytes >= 6 && ReadNumber(pBytes, 4, true) == 0xFF4FFF51 && ReadNumber(pBytes + 4, 2, true) >= 41;
}

bool IsBoxed(const unsigned char* pBytes, std::size_t nBytes)
{
    constexpr std::size_t TYPES = sizeof(SIGNATURE) + 8; // where the file type's first name stands
    if (nBytes < TYPES + 8 || std::memcmp(pBytes, SIGNATURE, sizeof(SIGNATURE)) != 0 ||
        ReadNumber(pBytes + sizeof(SIGNATURE) + 4, 4, true) != BoxType("ftyp"))
        return false;
    const std::size_t nBox = static_cast<std::size_t>(ReadNumber(pBytes + sizeof(SIGNATURE), 4, true));
    const std::size_t nEnd = std::min(nBytes, sizeof(SIGNATURE) + nBox);
    // A version follows the first name, then the others.
    for (std::size_t nAt = TYPES; nAt + 4 <= nEnd; nAt += nAt == TYPES ? 8 : 4)
    {
        const auto nName = static_cast<std::uint32_t>(ReadNumber(pBytes + nAt, 4, true));
        if (nName == BoxType("jp2 ") || nName == BoxType("jpx ") || nName == BoxType("jph ") ||
            nName == BoxType("jpxb"))
            return true;
    }
    return false;
}

} // namespace krv::plugins::jp2
