#include "plugins/support/codec/lzw.h"

#include "toolkit/simd/memoryaccess.h"

#include <algorithm>

namespace krv::plugins::codec
{

namespace
{

// One word per code. A string of up to seven bytes is kept whole:
//   bits 0-55 the bytes, first one lowest; bits 56-63 their number.
// A longer one stands in the output already and is kept by its place there:
//   bits 0-7 its first byte; bits 8-31 its offset from where the table was last cleared; bits 32-47 its length;
//   bits 48-55 of no meaning; bits 56-63 LONG.
// Offsets fit: between two clear codes at most 3838 strings of at most 3839 bytes are recorded.
using Entry = std::uint64_t;

constexpr unsigned int CLEAR = 256;
constexpr unsigned int END = 257;
constexpr unsigned int FIRST = 258;
constexpr unsigned int TABLE_SIZE = 4096;
constexpr unsigned int MAX_WIDTH = 12;
constexpr unsigned int NO_CODE = TABLE_SIZE;

constexpr Entry ONE_BYTE = Entry{1} << 56;
constexpr std::size_t MOST_KEPT = 7;
constexpr std::size_t LONG = 8;
constexpr std::size_t NO_STRING = 9;
constexpr unsigned int NOWHERE = 48; // the shift that takes a byte to where it has no meaning

// The length of a string that is kept whole, otherwise LONG or NO_STRING.
constexpr std::size_t GetKind(Entry nEntry)
{
    return nEntry >> 56;
}
constexpr std::size_t GetLongLength(Entry nEntry)
{
    return (nEntry >> 32) & 0xFFFF;
}
constexpr std::size_t GetOffset(Entry nEntry)
{
    return (nEntry >> 8) & 0xFFFFFF;
}

constexpr Entry MakeLong(Entry nEntry, std::ptrdiff_t nOffset, std::size_t nLength)
{
    return Entry{LONG} << 56 | (nEntry & 0xFF) | static_cast<Entry>(nOffset) << 8 | static_cast<Entry>(nLength) << 32;
}

// Copies in steps of sixteen bytes, up to fifteen too many. The source may end right before the destination.
inline void CopyVectors(const unsigned char* source, unsigned char* destination, std::size_t nBytes)
{
    std::size_t i = 0;
    do
    {
        simd::Copy16(destination + i, source + i);
        i += 16;
    } while (i < nBytes);
}

// Decodes one block. bOld: the first edition of the coding.
template <bool bOld>
class LzwRun
{
public:
    LzwRun(Entry* table, const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput)
        : mpoTable(table), mpoInput(input), mnInput(nInput), mpoStart(output), mpoEnd(output + nOutput),
          mpoBase(output), mpoOut(output)
    {
    }

    Result Decode()
    {
        while (mpoOut < mpoEnd)
        {
            if constexpr (!bOld)
                RunFast();
            if (mpoOut < mpoEnd && !Step())
                break;
        }
        if (mpoOut < mpoEnd)
            return {moFault, static_cast<std::size_t>(mpoOut - mpoStart)};
        return {Status::eDone, static_cast<std::size_t>(mpoEnd - mpoStart), HasMore()};
    }

private:
    // Bits that writers without an end code, or with one of another width, may leave at the end.
    static constexpr std::uint64_t PADDING = 24;

    // Whether strings follow once the output is full.
    bool HasMore()
    {
        while (mnInput * 8 - mnBit >= PADDING)
        {
            const unsigned int nCode = ReadCode();
            if (nCode != CLEAR)
                return nCode != END;
            Clear();
        }
        return false;
    }

    // The number of entries at which codes become one bit wider.
    static constexpr unsigned int GetLimit(unsigned int nWidth)
    {
        return nWidth == MAX_WIDTH ? TABLE_SIZE : (1U << nWidth) - (bOld ? 0 : 1);
    }

    bool Fail(Status oStatus)
    {
        moFault = oStatus;
        return false;
    }

    // One code with every check, wherever input or output end. False when the block cannot go on.
    bool Step()
    {
        const unsigned int nCode = ReadCode();
        if (nCode == NO_CODE || nCode == END)
            return Fail(Status::eTruncated);
        if (nCode == CLEAR)
            Clear();
        else if (mbFresh && nCode < CLEAR)
            Begin(nCode);
        else if (!mbFresh && nCode <= mnNext)
            Append(nCode);
        else
            return Fail(Status::eCorrupt);
        return true;
    }

    unsigned int ReadCode()
    {
        const std::size_t nByte = mnBit >> 3;
        const unsigned int nShift = mnBit & 7;
        const unsigned int nBytes = (nShift + mnWidth + 7) / 8;
        if (nBytes > mnInput - nByte)
            return NO_CODE;
        mnBit += mnWidth;
        unsigned int nBits = 0;
        for (unsigned int i = 0; i < nBytes; ++i)
            nBits |= static_cast<unsigned int>(mpoInput[nByte + i]) << (bOld ? i : nBytes - 1 - i) * 8;
        return (nBits >> (bOld ? nShift : nBytes * 8 - nShift - mnWidth)) & ((1U << mnWidth) - 1);
    }

    void Clear()
    {
        mnWidth = 9;
        mnNext = FIRST;
        mbFresh = true;
        mpoBase = mpoOut;
    }

    void Begin(unsigned int nCode)
    {
        mbFresh = false;
        *mpoOut++ = static_cast<unsigned char>(nCode);
        SetPrevious(mpoTable[nCode], 1);
    }

    // Remembers the string of nLength bytes that was written last.
    void SetPrevious(Entry nEntry, std::size_t nLength)
    {
        const bool bWhole = nLength < MOST_KEPT;
        mnGrown = bWhole ? nEntry + ONE_BYTE
                         : MakeLong(nEntry, mpoOut - mpoBase - static_cast<std::ptrdiff_t>(nLength), nLength + 1);
        mnShift = bWhole ? static_cast<unsigned int>(nLength * 8) : NOWHERE;
    }

    // The previous string with one more byte, the first one of nEntry.
    Entry Extend(Entry nEntry) const { return mnGrown + ((nEntry & 0xFF) << mnShift); }

    void Append(unsigned int nCode)
    {
        const Entry nEntry = nCode == mnNext ? Extend(mnGrown) : mpoTable[nCode];
        if (mnNext < TABLE_SIZE)
            mpoTable[mnNext++] = Extend(nEntry);
        mnWidth += mnNext >= GetLimit(mnWidth) && mnWidth < MAX_WIDTH;
        Write(nEntry);
    }

    void Write(Entry nEntry)
    {
        const bool bLong = GetKind(nEntry) == LONG;
        const std::size_t nLength = bLong ? GetLongLength(nEntry) : GetKind(nEntry);
        const std::size_t nBytes = std::min(nLength, static_cast<std::size_t>(mpoEnd - mpoOut));
        const unsigned char* source = mpoBase + GetOffset(nEntry);
        for (std::size_t i = 0; i < nBytes; ++i)
            mpoOut[i] = bLong ? source[i] : static_cast<unsigned char>(nEntry >> (i * 8));
        mpoOut += nBytes;
        SetPrevious(nEntry, nBytes);
    }

    void RunFast()
    {
        if (mbFresh)
            return;
        if (mnWidth == 9)
            RunWidth<9>();
        if (mnWidth == 10)
            RunWidth<10>();
        if (mnWidth == 11)
            RunWidth<11>();
        if (mnWidth == 12)
            RunWidth<12>();
    }

    template <unsigned int nWidth>
    void RunWidth();

    Entry* mpoTable;
    const unsigned char* mpoInput;
    std::size_t mnInput;
    std::uint64_t mnBit = 0; // of the input, where the next code begins
    unsigned char* mpoStart;
    unsigned char* mpoEnd;
    unsigned char* mpoBase; // where the table was last cleared
    unsigned char* mpoOut;
    Entry mnGrown = 0;           // the string written last, longer by a byte that is still 0
    unsigned int mnShift = 0;    // where that byte belongs
    unsigned int mnNext = FIRST; // the entries there are
    unsigned int mnWidth = 9;
    bool mbFresh = true; // nothing written since the table was cleared
    Status moFault = Status::eTruncated;
};

// Codes of one width, while nothing near the ends of the buffers needs a check: stops before the first code that does.
template <bool bOld>
template <unsigned int nWidth>
void LzwRun<bOld>::RunWidth()
{
    constexpr unsigned int GROUP = 4;
    constexpr std::ptrdiff_t SLACK = 8 * GROUP;
    constexpr Entry MASK = (1U << nWidth) - 1;
    Entry* const table = mpoTable;
    Entry nGrown = mnGrown;
    std::size_t nShift = mnShift;
    std::size_t nNext = mnNext;
    Entry* next = table + nNext;
    std::uint64_t nBit = mnBit;
    unsigned char* out = mpoOut;
    const std::uint64_t nSafeBits = mnInput >= 8 ? (std::uint64_t{mnInput} - 8) * 8 : 0;

    // The k-th code since nNext was counted. False, and nothing done, when the code needs checks that are not made
    // here.
    auto oOne = [&](Entry nCode, std::size_t k) __attribute__((always_inline))
    {
        if (nCode >= nNext + k) [[unlikely]]
        {
            if (nCode > nNext + k)
                return false;
            next[k] = nGrown + ((nGrown & 0xFF) << nShift);
        }
        const Entry nEntry = table[nCode];
        next[k] = nGrown + ((nEntry & 0xFF) << nShift);
        const std::size_t nKind = GetKind(nEntry);
        if (nKind < MOST_KEPT) [[likely]]
        {
            simd::StoreLittleEndian(out, nEntry);
            out += nKind;
            nGrown = nEntry + ONE_BYTE;
            nShift = nKind * 8;
            return true;
        }
        const std::size_t nLength = nKind == MOST_KEPT ? nKind : GetLongLength(nEntry);
        if (nKind == MOST_KEPT)
            simd::StoreLittleEndian(out, nEntry);
        else if (nKind == NO_STRING || mpoEnd - out < static_cast<std::ptrdiff_t>(nLength) + 16 + SLACK)
            return false;
        else
        {
            CopyVectors(mpoBase + GetOffset(nEntry), out, nLength);
            if (nCode == nNext + k)
                out[nLength - 1] = static_cast<unsigned char>(nEntry);
        }
        nGrown = MakeLong(nEntry, out - mpoBase, nLength + 1);
        nShift = NOWHERE;
        out += nLength;
        return true;
    };

    std::size_t nDone = GROUP;
    while (nDone == GROUP && nNext + GROUP <= GetLimit(nWidth) && nBit <= nSafeBits && mpoEnd - out >= SLACK)
    {
        const Entry nBits = simd::LoadBigEndian<Entry>(mpoInput + (nBit >> 3)) << (nBit & 7);
        nDone = 0;
        if (oOne(nBits >> (64 - nWidth), 0) && ++nDone && oOne((nBits >> (64 - 2 * nWidth)) & MASK, 1) && ++nDone &&
            oOne((nBits >> (64 - 3 * nWidth)) & MASK, 2) && ++nDone && oOne((nBits >> (64 - 4 * nWidth)) & MASK, 3))
            ++nDone;
        nNext += nDone;
        next += nDone;
        nBit += nDone * nWidth;
    }
    bool bGood = nDone == GROUP;
    while (bGood && nNext < GetLimit(nWidth) && nBit <= nSafeBits && mpoEnd - out >= SLACK)
    {
        bGood = oOne((simd::LoadBigEndian<Entry>(mpoInput + (nBit >> 3)) << (nBit & 7)) >> (64 - nWidth), 0);
        nNext += bGood;
        next += bGood;
        nBit += bGood * nWidth;
    }
    mnGrown = nGrown;
    mnShift = static_cast<unsigned int>(nShift);
    mnNext = static_cast<unsigned int>(nNext);
    mnWidth += mnNext >= GetLimit(nWidth) && nWidth < MAX_WIDTH;
    mnBit = nBit;
    mpoOut = out;
}

} // namespace

struct LzwDecoder::Table
{
    Entry moEntries[TABLE_SIZE];

    Table()
    {
        for (Entry i = 0; i < CLEAR; ++i)
            moEntries[i] = i + ONE_BYTE;
        moEntries[CLEAR] = moEntries[END] = Entry{NO_STRING} << 56;
    }
};

LzwDecoder::LzwDecoder() = default;
LzwDecoder::~LzwDecoder() = default;

bool LzwDecoder::IsOldStyle(const unsigned char* input, std::size_t nInput)
{
    return nInput >= 2 && input[0] == 0 && (input[1] & 1) != 0;
}

Result LzwDecoder::Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput)
{
    if (!mpoTable)
        mpoTable = std::make_unique<Table>();
    if (IsOldStyle(input, nInput))
        return LzwRun<true>(mpoTable->moEntries, input, nInput, output, nOutput).Decode();
    return LzwRun<false>(mpoTable->moEntries, input, nInput, output, nOutput).Decode();
}

} // namespace krv::plugins::codec
