#include "plugins/support/file/roomrecord.h"

#include "plugins/support/file/numbers.h"

#include <algorithm>
#include <cstring>
#include <string_view>

namespace krv::plugins::support
{

namespace
{

// Then numbers of 8 bytes, little-endian: the place of the root, the size of the file, the number of parts, place
// and size of each; and the check of all of them.
constexpr std::string_view MAGIC("KRV\r\nROOM\x1A\0\0\0\0\0\1", 16);
constexpr std::size_t WORD = 8;
constexpr std::size_t FIXED_WORDS = 3;

// FNV-1a.
std::uint64_t Check(const unsigned char* pBytes, std::size_t nBytes)
{
    std::uint64_t nCheck = 0xCBF29CE484222325U;
    for (std::size_t nAt = 0; nAt < nBytes; ++nAt)
        nCheck = (nCheck ^ pBytes[nAt]) * 0x100000001B3U;
    return nCheck;
}

} // namespace

std::size_t RoomRecord::GetBytes(std::size_t nForeign)
{
    return MAGIC.size() + (FIXED_WORDS + 2 * nForeign + 1) * WORD;
}

std::vector<unsigned char> RoomRecord::Make(std::uint64_t nRoot) const
{
    std::vector<unsigned char> oBytes(MAGIC.begin(), MAGIC.end());
    for (const std::uint64_t nValue : {nRoot, mnFileBytes, std::uint64_t{moForeign.size()}})
        AppendNumber(oBytes, nValue, WORD, false);
    for (const Extent& oPart : moForeign)
        for (const std::uint64_t nValue : {oPart.mnOffset, oPart.mnBytes})
            AppendNumber(oBytes, nValue, WORD, false);
    AppendNumber(oBytes, Check(oBytes.data(), oBytes.size()), WORD, false);
    return oBytes;
}

std::optional<RoomRecord> RoomRecord::Read(const File& oFile, std::uint64_t nRoot, std::uint64_t nEnd)
{
    std::vector<unsigned char> oBytes(GetBytes(MAXIMUM_FOREIGN));
    oBytes.resize(oFile.ReadUpTo(nEnd, oBytes.data(), oBytes.size()));
    const auto Word = [&oBytes](std::size_t nWord)
    {
        return ReadNumber(oBytes.data() + MAGIC.size() + nWord * WORD, WORD, false);
    };
    if (oBytes.size() < GetBytes(0) || std::memcmp(oBytes.data(), MAGIC.data(), MAGIC.size()) != 0)
        return std::nullopt;
    const std::uint64_t nForeign = Word(2);
    if (nForeign > MAXIMUM_FOREIGN || oBytes.size() < GetBytes(nForeign) || Word(0) != nRoot ||
        Word(FIXED_WORDS + 2 * nForeign) != Check(oBytes.data(), GetBytes(nForeign) - WORD) ||
        Word(1) > oFile.GetSize() || Word(1) < nEnd + GetBytes(nForeign))
        return std::nullopt;
    RoomRecord oRecord;
    oRecord.mnFileBytes = Word(1);
    std::uint64_t nBefore = 0;
    for (std::size_t nAt = 0; nAt < nForeign; ++nAt)
    {
        const Extent oPart{Word(FIXED_WORDS + 2 * nAt), Word(FIXED_WORDS + 2 * nAt + 1), 0};
        if (oPart.mnOffset < nBefore || oPart.mnBytes > oRecord.mnFileBytes ||
            oPart.mnOffset > oRecord.mnFileBytes - oPart.mnBytes)
            return std::nullopt;
        nBefore = oPart.mnOffset + oPart.mnBytes;
        oRecord.moForeign.push_back(oPart);
    }
    return oRecord;
}

bool RoomRecord::SharesOwn(const std::vector<Extent>& oPieces) const
{
    std::uint64_t nEnd = 0;
    for (const Extent& oPiece : oPieces)
    {
        if (oPiece.mnOffset < nEnd &&
            std::none_of(moForeign.begin(), moForeign.end(),
                         [&](const Extent& oPart)
                         { return oPart.mnOffset <= oPiece.mnOffset && nEnd <= oPart.GetEnd(); }))
            return true;
        nEnd = std::max(nEnd, oPiece.GetEnd());
    }
    return false;
}

void RoomRecord::AddForeign(std::uint64_t nOffset, std::uint64_t nBytes)
{
    if (nBytes == 0)
        return;
    if (moForeign.size() == MAXIMUM_FOREIGN)
    {
        nBytes += nOffset - moForeign.front().mnOffset;
        nOffset = moForeign.front().mnOffset;
        moForeign.clear();
    }
    moForeign.push_back({nOffset, nBytes, 0});
}

} // namespace krv::plugins::support
