// FileEditor: the structure of an existing file, and which of its bytes are free.
#include "plugins/tif/reading/cloudheader.h"
#include "plugins/tif/writing/directorybytes.h"
#include "plugins/tif/writing/fileeditor.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <unordered_set>
#include <utility>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

// What the structure of an existing file may take in memory: no sound one takes more for each of its bytes.
constexpr std::uint64_t MODEL_BYTES = std::uint64_t{64} << 20;
constexpr std::uint64_t MODEL_BYTES_PER_BYTE = 16;
constexpr std::uint64_t STRILE_MODEL_BYTES = 3 * sizeof(std::uint64_t) + sizeof(std::uint32_t);
constexpr std::uint64_t LONGEST_LOADED_TEXT = 4096;
constexpr std::uint64_t MAXIMUM_TAG_BYTES = std::uint64_t{96} << 20;

// What geometry and role of a page are taken from; the values of other tags stay in the file until they are wanted.
bool IsNeeded(const Tag& oTag)
{
    constexpr std::uint16_t NEEDED[] = {
        TIFFTAG_SUBFILETYPE, TIFFTAG_OSUBFILETYPE, TIFFTAG_IMAGEWIDTH,      TIFFTAG_IMAGELENGTH,  TIFFTAG_BITSPERSAMPLE,
        TIFFTAG_COMPRESSION, TIFFTAG_PHOTOMETRIC,  TIFFTAG_SAMPLESPERPIXEL, TIFFTAG_ROWSPERSTRIP, TIFFTAG_PLANARCONFIG,
        TIFFTAG_TILEWIDTH,   TIFFTAG_TILELENGTH,   TIFFTAG_SUBIFD,          TIFFTAG_SAMPLEFORMAT};
    return std::find(std::begin(NEEDED), std::end(NEEDED), oTag.mnTag) != std::end(NEEDED) ||
           (oTag.mnTag == TIFFTAG_PAGENAME && oTag.mnCount <= LONGEST_PAGE_NAME) ||
           (oTag.mnTag == TIFFTAG_IMAGEDESCRIPTION && oTag.mnCount <= LONGEST_LOADED_TEXT);
}

FileHeader ReadHeaderOf(const support::File& oFile)
{
    PeekReader oReader(oFile);
    return ReadHeader(oReader);
}

} // namespace

FileEditor::FileEditor(const std::string& fileName)
    : FileEditor(std::make_shared<support::File>(fileName, support::File::Mode::eUpdate), std::nullopt)
{
    mpoSpace->Reuse(GetFile()->FindHeld());
}

FileEditor::FileEditor(std::shared_ptr<support::File> poFile, const std::optional<FileHeader>& oHeader)
    : FileWriter(std::move(poFile)), moHeader(oHeader ? *oHeader : ReadHeaderOf(*GetFile()))
{
    UseSpace(GetFile()->GetSize());
    mpoSpace->Age(moHeader.mnFirstDirectory);
    mnCommittedSize = GetFile()->GetSize();
    if (const std::optional<CloudHeader> oCloud = CloudHeader::Read(*GetFile(), moHeader))
    {
        mnCloudBytes = oCloud->moText.size();
        mnBeforeBlock = oCloud->mbLeaders && !oCloud->mbChanged ? CloudHeader::LEADER_BYTES : 0;
        mnBehindBlock = oCloud->mbTrailers && !oCloud->mbChanged ? CloudHeader::TRAILER_BYTES : 0;
    }
    mnModelBytes = MODEL_BYTES + MODEL_BYTES_PER_BYTE * mnCommittedSize;
    ReadPages();
    FindUnused();
}

void FileEditor::ReadPages()
{
    std::unordered_set<std::uint64_t> oSeen;
    for (std::uint64_t nOffset = moHeader.mnFirstDirectory; nOffset != 0;)
    {
        if (!oSeen.insert(nOffset).second || moPages.size() >= MAXIMUM_PAGES)
            Fail("the chain of its directories has no end; it cannot be updated");
        ReadPage(nOffset, false, nOffset);
    }
    const std::vector<std::uint64_t> oBelow = moPages.front()->moTags.GetNumbers(TIFFTAG_SUBIFD);
    mbBelowFirst = !oBelow.empty();
    for (const std::uint64_t nOffset : oBelow)
    {
        std::uint64_t nNext = 0;
        if (nOffset == 0 || !oSeen.insert(nOffset).second || oBelow.size() > MAXIMUM_SUBDIRECTORIES)
            Fail("the directories below its first one cannot be followed; it cannot be updated");
        ReadPage(nOffset, true, nNext);
    }
}

void FileEditor::ReadPage(std::uint64_t nOffset, bool bBelowFirst, std::uint64_t& nNext)
{
    PeekReader oReader(*GetFile());
    const RawDirectory oDirectory(oReader, moHeader, nOffset);
    auto poPage = std::make_shared<PageModel>(moHeader.mbBigEndian);
    const std::size_t nWord = moHeader.mbBigTiff ? 8 : 4;
    Charge(sizeof(PageModel) + oDirectory.GetEntries().size() * sizeof(Tag));
    std::vector<Tag>& oTags = poPage->moTags.EditTags();
    for (const DirectoryEntry& oEntry : oDirectory.GetEntries())
    {
        if (IsStrileTag(oEntry.mnTag))
            continue;
        Tag oTag{oEntry.mnTag, oEntry.mnType, oEntry.mnCount, {}, {}};
        if (GetTypeBytes(oEntry.mnType) == 0 || oEntry.GetBytes() > MAXIMUM_TAG_BYTES)
            Fail("tag " + std::to_string(oEntry.mnTag) + " is of an unknown type or size; the file cannot be updated");
        // What is added to the file would become the values that it lacks.
        const std::uint64_t nSize = GetFile()->GetSize();
        if (oEntry.GetBytes() > nWord && (oEntry.mnOffset > nSize || oEntry.GetBytes() > nSize - oEntry.mnOffset))
            Fail("the file is truncated: tag " + std::to_string(oEntry.mnTag) + " lies behind its end");
        if (oEntry.GetBytes() > nWord)
            oTag.moStored = {oEntry.mnOffset, oEntry.GetBytes(), 0};
        else
            oTag.moBytes.resize(oEntry.GetBytes());
        if (!oTag.moBytes.empty())
            GetFile()->Read(oEntry.mnOffset, oTag.moBytes.data(), oTag.moBytes.size());
        oTags.push_back(std::move(oTag));
    }
    // The first of two tags of a number counts, for readers too.
    std::stable_sort(oTags.begin(), oTags.end(),
                     [](const Tag& oFirst, const Tag& oSecond) { return oFirst.mnTag < oSecond.mnTag; });
    oTags.erase(std::unique(oTags.begin(), oTags.end(),
                            [](const Tag& oFirst, const Tag& oSecond) { return oFirst.mnTag == oSecond.mnTag; }),
                oTags.end());
    for (Tag& oTag : oTags)
        if (IsNeeded(oTag))
            Load(oTag);
    ReadStriles(*poPage, oDirectory);
    poPage->moDirectory = {nOffset, GetDirectoryBytes(oDirectory.GetEntries().size(), moHeader), 0};
    poPage->mnNext = oDirectory.GetNext();
    poPage->mbBelowFirst = bBelowFirst;
    poPage->mnNumber = mnNextNumber++;
    nNext = oDirectory.GetNext();
    moPages.push_back(std::move(poPage));
}

void FileEditor::ReadStriles(PageModel& oPage, const RawDirectory& oDirectory)
{
    const StrileEntries oEntries(oDirectory);
    const DirectoryEntry* pOffsets = oEntries.mpOffsets;
    const DirectoryEntry* pCounts = oEntries.mpByteCounts;
    const std::uint64_t nStriles = oPage.CountStriles();
    if (pOffsets == nullptr || pCounts == nullptr || pOffsets->mnCount < nStriles || pCounts->mnCount < nStriles)
        Fail("a directory does not say where all strips or tiles lie and how long they are; it cannot be updated");
    if (nStriles > MAXIMUM_STRILES)
        Fail("there are too many strips or tiles to be updated");
    Charge(nStriles * STRILE_MODEL_BYTES);
    oPage.SetStriles(nStriles);
    const std::size_t nWord = moHeader.mbBigTiff ? 8 : 4;
    StrileArray oOffsets(*GetFile(), *pOffsets, moHeader.mbBigEndian);
    StrileArray oCounts(*GetFile(), *pCounts, moHeader.mbBigEndian);
    for (std::uint64_t nAt = 0; nAt < nStriles; ++nAt)
    {
        oPage.moOffsets[nAt] = oOffsets.Get(*GetFile(), nAt);
        oPage.moByteCounts[nAt] = oCounts.Get(*GetFile(), nAt);
    }
    oPage.moRoom = oPage.moByteCounts;
    const StrileShape oShape = oPage.GetShape();
    for (std::uint64_t nAt = 0; oShape.mbOnlyStrips && nAt < nStriles; ++nAt)
    {
        const Strile oStrip = oPage.Get(nAt);
        if (oStrip.mnOffset == 0)
            continue;
        oPage.moByteCounts[nAt] = FindOnlyStripBytes(oStrip, oShape, oDirectory, oPage.moOffsets, GetFile()->GetSize());
        // Room that its directory does not claim is not given up with it.
        if (oPage.moByteCounts[nAt] != oStrip.mnBytes)
            oPage.moRoom[nAt] = 0;
    }
    // What is added to the file would otherwise be taken for what is missing.
    for (std::uint64_t nAt = 0; nAt < nStriles; ++nAt)
        if (oPage.moByteCounts[nAt] > GetFile()->GetSize() ||
            oPage.moOffsets[nAt] > GetFile()->GetSize() - oPage.moByteCounts[nAt])
            Fail("the file is truncated: strip or tile " + std::to_string(nAt) +
                 " lies behind its end; it cannot be updated");
    if (pOffsets->GetBytes() > nWord)
        oPage.moOffsetArray = {pOffsets->mnOffset, pOffsets->GetBytes(), 0};
    if (pCounts->GetBytes() > nWord)
        oPage.moCountArray = {pCounts->mnOffset, pCounts->GetBytes(), 0};
    // Arrays are written anew in the types that they get here.
    const std::uint16_t nType = moHeader.mbBigTiff ? TIFF_LONG8 : TIFF_LONG;
    oPage.mbArraysStale = pOffsets->mnType != nType || pCounts->mnType != nType || pOffsets->mnCount != nStriles ||
                          pCounts->mnCount != nStriles;
}

// Pages that share or overlap what they are made of claim more than the file holds.
void FileEditor::Charge(std::uint64_t nBytes)
{
    if (nBytes > mnModelBytes)
        Fail("its directories claim far more than the file holds; it cannot be updated");
    mnModelBytes -= nBytes;
}

void FileEditor::Load(Tag& oTag)
{
    if (!oTag.moBytes.empty() || oTag.mnCount == 0)
        return;
    Charge(oTag.GetBytes());
    oTag.moBytes.resize(oTag.GetBytes());
    GetFile()->Read(oTag.moStored.mnOffset, oTag.moBytes.data(), oTag.moBytes.size());
}

void FileEditor::LoadTags(PageModel& oPage)
{
    for (Tag& oTag : oPage.moTags.EditTags())
        Load(oTag);
}

std::vector<Extent> FileEditor::ListUsed() const
{
    std::vector<Extent> oUsed = {{0, moHeader.GetBytes() + mnCloudBytes, 0}};
    const auto Add = [&oUsed](const Extent& oPiece)
    {
        if (oPiece.mnBytes != 0)
            oUsed.push_back(oPiece);
    };
    for (const std::shared_ptr<PageModel>& poPage : moPages)
    {
        for (const Extent& oPiece : {poPage->moDirectory, poPage->moOffsetArray, poPage->moCountArray})
            Add(oPiece);
        for (const Tag& oTag : poPage->moTags.GetTags())
            Add(oTag.moStored);
        for (std::size_t nAt = 0; nAt < poPage->GetStriles(); ++nAt)
        {
            const std::uint64_t nOffset = poPage->moOffsets[nAt];
            const std::uint64_t nBytes = std::max(poPage->moRoom[nAt], poPage->moByteCounts[nAt]);
            const std::uint64_t nBefore = std::min(mnBeforeBlock, nOffset);
            if (nBytes != 0)
                Add({nOffset - nBefore, nBefore + nBytes + mnBehindBlock, 0});
        }
    }
    std::sort(oUsed.begin(), oUsed.end(),
              [](const Extent& oFirst, const Extent& oSecond) { return oFirst.mnOffset < oSecond.mnOffset; });
    return oUsed;
}

void FileEditor::FindUnused()
{
    Extent& oRoot = moPages.front()->moDirectory;
    const std::uint64_t nSize = GetFile()->GetSize();
    const std::optional<support::RoomRecord> oRecord =
        support::RoomRecord::Read(*GetFile(), oRoot.mnOffset, oRoot.GetEnd());
    moRecord = oRecord.value_or(support::RoomRecord());
    if (oRecord)
        oRoot.mnBytes += oRecord->GetBytes();
    // What lies behind the end that is recorded was added by somebody else, or by a writer that was killed.
    moRecord.AddForeign(moRecord.mnFileBytes, nSize - moRecord.mnFileBytes);
    std::vector<Extent> oTaken = ListUsed();
    if (moRecord.SharesOwn(oTaken))
    {
        moRecord = support::RoomRecord();
        moRecord.AddForeign(0, nSize);
    }
    oTaken.insert(oTaken.end(), moRecord.moForeign.begin(), moRecord.moForeign.end());
    mpoSpace->AddUnusedBetween(std::move(oTaken), nSize);
    for (const Extent& oPart : moRecord.moForeign)
        mpoSpace->Keep(oPart.mnOffset, oPart.mnBytes);
}

std::optional<std::uint64_t> FileEditor::GetUnusedBytes() const
{
    const bool bForeign = moRecord.moForeign.size() == 1 && moRecord.moForeign.front().mnOffset == 0 &&
                          moRecord.moForeign.front().mnBytes >= mnCommittedSize;
    return bForeign ? std::nullopt : std::optional(mpoSpace->CountUnused());
}

std::optional<std::uint64_t> FileEditor::CountUnusedBytes(std::shared_ptr<support::File> poFile,
                                                          const FileHeader& oHeader)
{
    PeekReader oReader(*poFile);
    const RawDirectory oRoot(oReader, oHeader, oHeader.mnFirstDirectory);
    const std::uint64_t nEnd = oRoot.GetOffset() + GetDirectoryBytes(oRoot.GetEntries().size(), oHeader);
    if (!support::RoomRecord::Read(*poFile, oRoot.GetOffset(), nEnd))
        return std::nullopt;
    return FileEditor(std::move(poFile), oHeader).GetUnusedBytes();
}

} // namespace krv::plugins::tif
