#include "plugins/tif/reading/striletable.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

const DirectoryEntry* FindEither(const RawDirectory& oDirectory, std::uint16_t nFirst, std::uint16_t nSecond)
{
    const DirectoryEntry* pEntry = oDirectory.Find(nFirst);
    return pEntry != nullptr ? pEntry : oDirectory.Find(nSecond);
}

bool IsLongEnough(const Strile& oStrip, const StrileShape& oShape)
{
    return oStrip.mnBytes >= std::max<std::uint64_t>(1, oShape.mnPlainBytes);
}

} // namespace

StrileArray::StrileArray(const support::File& oFile, const DirectoryEntry& oEntry, bool bBigEndian)
    : mnCount(oEntry.mnCount), mnOffset(oEntry.mnOffset), mnValueBytes(GetTypeBytes(oEntry.mnType)),
      mbBigEndian(bBigEndian), moPages(PAGES)
{
    const bool bWhole = IsWholeType(oEntry.mnType) || oEntry.mnType == TIFF_SSHORT || oEntry.mnType == TIFF_SLONG ||
                        oEntry.mnType == TIFF_SLONG8;
    if (!bWhole)
        throw FileFormatException(oFile.GetName(), oFile.GetName() + ": tag " + std::to_string(oEntry.mnTag) +
                                                       " holds no whole numbers");
}

const StrileArray::Page& StrileArray::GetPage(const support::File& oFile, std::uint64_t nNumber)
{
    Page& oPage = moPages[nNumber % PAGES];
    if (oPage.mnNumber == nNumber)
        return oPage;
    oPage.mnNumber = UINT64_MAX;
    const std::uint64_t nFirst = nNumber * PAGE_VALUES;
    const auto nValues = static_cast<std::size_t>(std::min<std::uint64_t>(PAGE_VALUES, mnCount - nFirst));
    std::vector<unsigned char> oBytes(nValues * mnValueBytes);
    const std::uint64_t nOffset = mnOffset + nFirst * mnValueBytes;
    const std::size_t nGot = nOffset < mnOffset ? 0 : oFile.ReadUpTo(nOffset, oBytes.data(), oBytes.size());
    oPage.moValues.resize(nGot / mnValueBytes);
    for (std::size_t nAt = 0; nAt < oPage.moValues.size(); ++nAt)
        oPage.moValues[nAt] = ReadNumber(oBytes.data() + nAt * mnValueBytes, mnValueBytes, mbBigEndian);
    oPage.mnNumber = nNumber;
    return oPage;
}

std::uint64_t StrileArray::Get(const support::File& oFile, std::uint64_t nIndex)
{
    const Page& oPage = GetPage(oFile, nIndex / PAGE_VALUES);
    if (nIndex % PAGE_VALUES >= oPage.moValues.size())
        throw FileFormatException(oFile.GetName(),
                                  oFile.GetName() + ": the file is truncated: the list of its strips or tiles is cut "
                                                    "off by the end of the file");
    return oPage.moValues[nIndex % PAGE_VALUES];
}

StrileEntries::StrileEntries(const RawDirectory& oDirectory)
    : mpOffsets(FindEither(oDirectory, TIFFTAG_TILEOFFSETS, TIFFTAG_STRIPOFFSETS)),
      mpByteCounts(FindEither(oDirectory, TIFFTAG_TILEBYTECOUNTS, TIFFTAG_STRIPBYTECOUNTS))
{
}

IStrileIndex::~IStrileIndex() = default;

std::uint64_t FindOnlyStripBytes(const Strile& oStrip, const StrileShape& oShape, const RawDirectory& oDirectory,
                                 std::span<const std::uint64_t> oOffsets, std::uint64_t nFileBytes)
{
    if (IsLongEnough(oStrip, oShape))
        return oShape.mnPlainBytes != 0 ? oShape.mnPlainBytes : oStrip.mnBytes;
    std::uint64_t nNext = std::max(nFileBytes, oStrip.mnOffset);
    const auto Bound = [&](std::uint64_t nOffset)
    {
        nNext = nOffset > oStrip.mnOffset ? std::min(nNext, nOffset) : nNext;
    };
    Bound(oDirectory.GetOffset());
    Bound(oDirectory.GetNext());
    for (const DirectoryEntry& oEntry : oDirectory.GetEntries())
        Bound(oEntry.mnOffset);
    for (const std::uint64_t nOffset : oOffsets)
        Bound(nOffset);
    const std::uint64_t nRest = nNext - oStrip.mnOffset;
    return oShape.mnPlainBytes != 0 ? std::max(oStrip.mnBytes, std::min(nRest, oShape.mnPlainBytes)) : nRest;
}

StrileTable::StrileTable(const support::File& oFile, const RawDirectory& oDirectory, bool bBigEndian,
                         const StrileShape& oShape)
    : moFile(oFile), moDirectory(oDirectory), moShape(oShape)
{
    const StrileEntries oEntries(oDirectory);
    if (oEntries.mpOffsets == nullptr)
        throw FileFormatException(oFile.GetName(), oFile.GetName() + ": the directory does not say where the " +
                                                       std::to_string(oShape.mnCount) + " strips or tiles lie");
    moOffsets = StrileArray(oFile, *oEntries.mpOffsets, bBigEndian);
    mbByteCounts = oEntries.mpByteCounts != nullptr;
    if (mbByteCounts)
        moByteCounts = StrileArray(oFile, *oEntries.mpByteCounts, bBigEndian);
}

Strile StrileTable::Read(std::uint64_t nIndex)
{
    if (nIndex >= moOffsets.GetCount() || (mbByteCounts && nIndex >= moByteCounts.GetCount()))
        throw FileFormatException(moFile.GetName(),
                                  moFile.GetName() + ": the directory lists " + std::to_string(moOffsets.GetCount()) +
                                      " strips or tiles; number " + std::to_string(nIndex) + " is wanted");
    Strile oStrile;
    oStrile.mnOffset = moOffsets.Get(moFile, nIndex);
    oStrile.mbBytesKnown = mbByteCounts;
    oStrile.mnBytes = mbByteCounts ? moByteCounts.Get(moFile, nIndex) : 0;
    if (!moShape.mbOnlyStrips || oStrile.mnOffset == 0 || IsLongEnough(oStrile, moShape))
        return oStrile;
    std::vector<std::uint64_t> oOffsets(std::min(moShape.mnCount, moOffsets.GetCount()));
    for (std::uint64_t nAt = 0; nAt < oOffsets.size(); ++nAt)
        oOffsets[nAt] = moOffsets.Get(moFile, nAt);
    return {oStrile.mnOffset, FindOnlyStripBytes(oStrile, moShape, moDirectory, oOffsets, moFile.GetSize()), true};
}

Strile StrileTable::Get(std::uint64_t nIndex)
{
    const Strile oStrile = mpoIndex ? mpoIndex->Get(nIndex) : Read(nIndex);
    if (oStrile.mbBytesKnown && oStrile.mnBytes == 0 && oStrile.mnOffset != 0)
        throw FileFormatException(moFile.GetName(), moFile.GetName() + ": strip or tile " + std::to_string(nIndex) +
                                                        " has a place in the file and no bytes");
    return oStrile;
}

} // namespace krv::plugins::tif
