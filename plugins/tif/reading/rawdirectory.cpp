#include "plugins/tif/reading/rawdirectory.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint64_t CLASSIC_VERSION = 42;
constexpr std::uint64_t BIG_VERSION = 43;

void WriteNumber(unsigned char* pBytes, std::size_t nBytes, bool bBigEndian, std::uint64_t nValue)
{
    for (std::size_t nAt = 0; nAt < nBytes; ++nAt)
        pBytes[bBigEndian ? nBytes - 1 - nAt : nAt] = static_cast<unsigned char>(nValue >> (8 * nAt));
}

} // namespace

void ThrowDamaged(const std::string& fileName, const std::string& what, const Place& oPlace)
{
    throw FileFormatException(fileName, fileName + ": " + what + "; the file is damaged", oPlace);
}

FileHeader ReadHeader(PeekReader& oReader)
{
    const support::File& oFile = oReader.GetFile();
    unsigned char aHeader[FileHeader::BYTES] = {};
    oReader.Forget();
    const std::size_t nBytes = oReader.Read(0, aHeader, sizeof(aHeader));
    const std::optional<FileHeader> oHeader = FileHeader::Parse(aHeader, nBytes);
    if (!oHeader)
        throw FileFormatException(oFile.GetName(), oFile.GetName() + ": is no TIFF file");
    return *oHeader;
}

bool IsStrileTag(std::uint16_t nTag)
{
    return nTag == TIFFTAG_STRIPOFFSETS || nTag == TIFFTAG_STRIPBYTECOUNTS || nTag == TIFFTAG_TILEOFFSETS ||
           nTag == TIFFTAG_TILEBYTECOUNTS;
}

std::size_t GetTypeBytes(std::uint16_t nType)
{
    constexpr std::size_t BYTES[] = {0, 1, 1, 2, 4, 8, 1, 1, 2, 4, 8, 4, 8, 4, 0, 0, 8, 8, 8};
    return nType < std::size(BYTES) ? BYTES[nType] : 0;
}

bool IsWholeType(std::uint16_t nType)
{
    constexpr std::uint16_t WHOLE[] = {TIFF_BYTE, TIFF_SHORT, TIFF_LONG, TIFF_IFD, TIFF_LONG8, TIFF_IFD8};
    return std::find(std::begin(WHOLE), std::end(WHOLE), nType) != std::end(WHOLE);
}

std::optional<FileHeader> FileHeader::Parse(const unsigned char* pBytes, std::size_t nBytes)
{
    if (nBytes < 8 || pBytes[0] != pBytes[1] || (pBytes[0] != 'I' && pBytes[0] != 'M'))
        return std::nullopt;
    FileHeader oHeader;
    oHeader.mbBigEndian = pBytes[0] == 'M';
    const auto nVersion = ReadNumber(pBytes + 2, 2, oHeader.mbBigEndian);
    oHeader.mbBigTiff = nVersion == BIG_VERSION;
    if (nVersion == CLASSIC_VERSION)
        oHeader.mnFirstDirectory = ReadNumber(pBytes + 4, 4, oHeader.mbBigEndian);
    else if (nVersion == BIG_VERSION && nBytes >= BYTES &&
             ReadNumber(pBytes + 4, 4, oHeader.mbBigEndian) == (oHeader.mbBigEndian ? 8u << 16 : 8u))
        oHeader.mnFirstDirectory = ReadNumber(pBytes + 8, 8, oHeader.mbBigEndian);
    const bool bSane = oHeader.mnFirstDirectory >= oHeader.GetBytes() && oHeader.mnFirstDirectory < std::uint64_t{1}
                                                                                                        << 62;
    return bSane ? std::optional(oHeader) : std::nullopt;
}

void FileHeader::Write(unsigned char* pBytes, std::uint64_t nFirstDirectory) const
{
    pBytes[0] = pBytes[1] = mbBigEndian ? 'M' : 'I';
    WriteNumber(pBytes + 2, 2, mbBigEndian, mbBigTiff ? BIG_VERSION : CLASSIC_VERSION);
    if (!mbBigTiff)
        return WriteNumber(pBytes + 4, 4, mbBigEndian, nFirstDirectory);
    WriteNumber(pBytes + 4, 2, mbBigEndian, 8);
    WriteNumber(pBytes + 6, 2, mbBigEndian, 0);
    WriteNumber(pBytes + 8, 8, mbBigEndian, nFirstDirectory);
}

std::uint64_t DirectoryEntry::GetBytes() const
{
    std::uint64_t nBytes = 0;
    return __builtin_mul_overflow(mnCount, std::uint64_t{GetTypeBytes(mnType)}, &nBytes) ? UINT64_MAX : nBytes;
}

RawDirectory::RawDirectory(PeekReader& oReader, const FileHeader& oHeader, std::uint64_t nOffset)
    : moHeader(oHeader), mnOffset(nOffset)
{
    const std::string& fileName = oReader.GetFile().GetName();
    const std::size_t nCountBytes = oHeader.mbBigTiff ? 8 : 2;
    const std::size_t nWord = oHeader.mbBigTiff ? 8 : 4;
    const std::size_t nEntryBytes = 4 + 2 * nWord;
    unsigned char aCount[8];
    if (oReader.Read(nOffset, aCount, nCountBytes) != nCountBytes)
        ThrowDamaged(fileName,
                     "the directory at offset " + std::to_string(nOffset) + " lies behind the end of the file",
                     Place::Current());
    const std::uint64_t nEntries = ReadNumber(aCount, nCountBytes, oHeader.mbBigEndian);
    if (nEntries == 0 || nEntries > MAXIMUM_ENTRIES)
        ThrowDamaged(fileName,
                     "the directory at offset " + std::to_string(nOffset) + " has " + std::to_string(nEntries) +
                         " entries",
                     Place::Current());

    std::vector<unsigned char> oBytes(nEntries * nEntryBytes + nWord);
    const std::size_t nGot = oReader.Read(nOffset + nCountBytes, oBytes.data(), oBytes.size());
    if (nGot < nEntries * nEntryBytes)
        ThrowDamaged(fileName,
                     "the directory at offset " + std::to_string(nOffset) + " is cut off by the end of the file",
                     Place::Current());
    moEntries.reserve(nEntries);
    for (std::size_t nAt = 0; nAt < nEntries; ++nAt)
    {
        const unsigned char* pEntry = oBytes.data() + nAt * nEntryBytes;
        DirectoryEntry oEntry;
        oEntry.mnTag = static_cast<std::uint16_t>(ReadNumber(pEntry, 2, oHeader.mbBigEndian));
        oEntry.mnType = static_cast<std::uint16_t>(ReadNumber(pEntry + 2, 2, oHeader.mbBigEndian));
        oEntry.mnCount = ReadNumber(pEntry + 4, nWord, oHeader.mbBigEndian);
        oEntry.mnOffset = oEntry.GetBytes() <= nWord ? nOffset + nCountBytes + nAt * nEntryBytes + 4 + nWord
                                                     : ReadNumber(pEntry + 4 + nWord, nWord, oHeader.mbBigEndian);
        moEntries.push_back(oEntry);
    }
    if (nGot == oBytes.size())
        mnNext = ReadNumber(oBytes.data() + nEntries * nEntryBytes, nWord, oHeader.mbBigEndian);
}

const DirectoryEntry* RawDirectory::Find(std::uint16_t nTag) const
{
    const auto oFound = std::find_if(moEntries.begin(), moEntries.end(),
                                     [nTag](const DirectoryEntry& oEntry) { return oEntry.mnTag == nTag; });
    return oFound == moEntries.end() ? nullptr : &*oFound;
}

std::uint64_t RawDirectory::GetNumber(PeekReader& oReader, std::uint16_t nTag, std::uint64_t nDefault) const
{
    const DirectoryEntry* pEntry = Find(nTag);
    if (pEntry == nullptr || pEntry->mnCount == 0 || !IsWholeType(pEntry->mnType))
        return nDefault;
    unsigned char aValue[8];
    const std::size_t nBytes = GetTypeBytes(pEntry->mnType);
    return oReader.Read(pEntry->mnOffset, aValue, nBytes) == nBytes ? ReadNumber(aValue, nBytes, moHeader.mbBigEndian)
                                                                    : nDefault;
}

std::vector<std::uint64_t> RawDirectory::GetNumbers(PeekReader& oReader, std::uint16_t nTag, std::size_t nLimit) const
{
    const DirectoryEntry* pEntry = Find(nTag);
    if (pEntry == nullptr || !IsWholeType(pEntry->mnType))
        return {};
    const std::size_t nValueBytes = GetTypeBytes(pEntry->mnType);
    const auto nCount = static_cast<std::size_t>(std::min<std::uint64_t>(pEntry->mnCount, nLimit));
    std::vector<unsigned char> oBytes(nCount * nValueBytes);
    const std::size_t nGot = oReader.Read(pEntry->mnOffset, oBytes.data(), oBytes.size()) / nValueBytes;
    std::vector<std::uint64_t> oNumbers;
    for (std::size_t nAt = 0; nAt < nGot; ++nAt)
        oNumbers.push_back(ReadNumber(oBytes.data() + nAt * nValueBytes, nValueBytes, moHeader.mbBigEndian));
    return oNumbers;
}

} // namespace krv::plugins::tif
