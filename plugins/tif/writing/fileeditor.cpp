#include "plugins/tif/writing/fileeditor.h"

#include "plugins/tif/writing/cloudlayout.h"
#include "plugins/tif/writing/directorybytes.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstdio>
#include <unordered_set>
#include <utility>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint64_t CLASSIC_LIMIT = UINT32_MAX;
// An image of this size gets a BigTIFF: its levels and directories want room too.
constexpr std::uint64_t CLASSIC_IMAGE_LIMIT = std::uint64_t{2900} << 20;
// Large blocks that begin at multiples of their own size are slow in the system's cache.
constexpr std::uint64_t FIRST_BLOCK = 16384;
constexpr std::uint64_t LARGE_BLOCK = 32768;
constexpr std::uint64_t DIRECTORY_RESERVE = 65536;
constexpr std::uint64_t MAXIMUM_STRILES = std::uint64_t{1} << 28;
// What the structure of an existing file may take in memory: no sound one takes more for each of its bytes.
constexpr std::uint64_t MODEL_BYTES = std::uint64_t{64} << 20;
constexpr std::uint64_t MODEL_BYTES_PER_BYTE = 16;
constexpr std::uint64_t STRILE_MODEL_BYTES = 3 * sizeof(std::uint64_t) + sizeof(std::uint32_t);
constexpr std::uint64_t LONGEST_LOADED_TEXT = 4096;
constexpr std::uint64_t MAXIMUM_TAG_BYTES = std::uint64_t{96} << 20;
// A file up to this size costs little to be written twice.
constexpr std::uint64_t SMALL_FILE = std::uint64_t{4} << 20;
constexpr std::size_t COPY_BYTES = std::size_t{1} << 20;

bool IsStrileTag(std::uint16_t nTag)
{
    return nTag == TIFFTAG_STRIPOFFSETS || nTag == TIFFTAG_TILEOFFSETS || nTag == TIFFTAG_STRIPBYTECOUNTS ||
           nTag == TIFFTAG_TILEBYTECOUNTS;
}

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

std::uint64_t GetEnd(const Extent& oPiece)
{
    return oPiece.mnOffset + oPiece.mnBytes;
}

FileHeader ReadHeader(const support::File& oFile)
{
    unsigned char aHeader[FileHeader::BYTES] = {};
    const std::size_t nBytes = oFile.ReadUpTo(0, aHeader, sizeof(aHeader));
    const std::optional<FileHeader> oHeader = FileHeader::Parse(aHeader, nBytes);
    if (!oHeader)
        throw FileFormatException(oFile.GetName(), oFile.GetName() + ": is no TIFF file");
    return *oHeader;
}

} // namespace

// A directory that was written and the places of what it names, until it is committed.
struct FileEditor::Written
{
    PageModel* mpPage = nullptr;
    Extent moDirectory;
    std::uint64_t mnNext = 0;
    Extent moOffsetArray;
    Extent moCountArray;
};

FileEditor::Operation::Operation(FileEditor& oEditor)
    : moEditor(oEditor), mbOuter(!oEditor.mbOperation), mnReleased(oEditor.moReleased.size()),
      mnModelBytes(oEditor.mnModelBytes), mbChanged(oEditor.mbChanged)
{
    if (!mbOuter)
        return;
    for (const std::shared_ptr<PageModel>& poPage : oEditor.moPages)
        moPages.push_back({poPage, poPage->moTags, poPage->moDraft, poPage->mbStrilesChanged});
    oEditor.mbOperation = true;
    oEditor.mpoSpace->Begin();
}

FileEditor::Operation::~Operation()
{
    if (!mbOuter || mbAdopted)
        return;
    moEditor.moPages.resize(moPages.size());
    for (std::size_t nAt = 0; nAt < moPages.size(); ++nAt)
    {
        Saved& oSaved = moPages[nAt];
        oSaved.mpoPage->moTags = std::move(oSaved.moTags);
        oSaved.mpoPage->moDraft = oSaved.moDraft;
        oSaved.mpoPage->mbStrilesChanged = oSaved.mbStrilesChanged;
        moEditor.moPages[nAt] = std::move(oSaved.mpoPage);
    }
    moEditor.moReleased.resize(mnReleased);
    moEditor.mnModelBytes = mnModelBytes;
    moEditor.mbChanged = mbChanged;
    moEditor.mbOperation = false;
    moEditor.mpoSpace->Undo();
}

void FileEditor::Operation::Adopt()
{
    mbAdopted = true;
    if (!mbOuter)
        return;
    for (const Saved& oSaved : moPages)
        oSaved.mpoPage->mbGone = true;
    for (const std::shared_ptr<PageModel>& poPage : moEditor.moPages)
        poPage->mbGone = false;
    moEditor.mbOperation = false;
    moEditor.mpoSpace->Adopt();
}

FileEditor::FileEditor(const std::string& fileName)
    : FileEditor(std::make_shared<support::File>(fileName, support::File::Mode::eUpdate), std::nullopt)
{
    mpoSpace->Reuse(mpoFile->FindHeld());
}

FileEditor::FileEditor(std::shared_ptr<support::File> poFile, const std::optional<FileHeader>& oHeader)
    : moFileName(poFile->GetName()), mpoFile(std::move(poFile)), moHeader(oHeader ? *oHeader : ReadHeader(*mpoFile))
{
    UseSpace(mpoFile->GetSize());
    mpoSpace->Age(moHeader.mnFirstDirectory);
    mnCommittedSize = mpoFile->GetSize();
    mnModelBytes = MODEL_BYTES + MODEL_BYTES_PER_BYTE * mnCommittedSize;
    ReadPages();
    FindUnused();
}

FileEditor::FileEditor(const std::string& fileName, const CreateOptions& oOptions)
    : moFileName(fileName), moOptions(oOptions), mbNamed(false)
{
}

FileEditor::~FileEditor()
{
    Discard();
}

void FileEditor::Discard() noexcept
{
    if (!mbEnded && moTemporary.empty() && mpoFile)
        mpoFile->CutBack(mnCommittedSize);
    End();
    if (moTemporary.empty())
        return;
    std::remove(moTemporary.c_str());
    moTemporary.clear();
}

void FileEditor::End()
{
    mbEnded = true;
    if (mpoFile)
        mpoFile->EndWriting();
}

void FileEditor::Fail(const std::string& what, const Place& oPlace) const
{
    throw FileFormatException(moFileName, moFileName + ": " + what, oPlace);
}

void FileEditor::CheckWritable(const Place& oPlace) const
{
    if (mbEnded)
        throw DataException(moFileName + ": the dataset is closed", oPlace);
}

const std::shared_ptr<PageModel>& FileEditor::GetPage(std::uint64_t nNumber, const Place& oPlace) const
{
    const auto oFound =
        std::find_if(moPages.begin(), moPages.end(),
                     [nNumber](const std::shared_ptr<PageModel>& poPage) { return poPage->mnNumber == nNumber; });
    if (oFound == moPages.end())
        throw DataException(moFileName + ": the page is no longer there", oPlace);
    return *oFound;
}

std::vector<PageSummary> FileEditor::Summarise() const
{
    std::vector<PageSummary> oSummaries;
    for (const std::shared_ptr<PageModel>& poPage : moPages)
        oSummaries.push_back(poPage->Summarise());
    return oSummaries;
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
    PeekReader oReader(*mpoFile);
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
        const std::uint64_t nSize = mpoFile->GetSize();
        if (oEntry.GetBytes() > nWord && (oEntry.mnOffset > nSize || oEntry.GetBytes() > nSize - oEntry.mnOffset))
            Fail("the file is truncated: tag " + std::to_string(oEntry.mnTag) + " lies behind its end");
        if (oEntry.GetBytes() > nWord)
            oTag.moStored = {oEntry.mnOffset, oEntry.GetBytes(), 0};
        else
            oTag.moBytes.resize(oEntry.GetBytes());
        if (!oTag.moBytes.empty())
            mpoFile->Read(oEntry.mnOffset, oTag.moBytes.data(), oTag.moBytes.size());
        oTags.push_back(std::move(oTag));
    }
    // Of a tag that is there twice the first counts, for readers too.
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
    StrileArray oOffsets(*mpoFile, *pOffsets, moHeader.mbBigEndian);
    StrileArray oCounts(*mpoFile, *pCounts, moHeader.mbBigEndian);
    for (std::uint64_t nAt = 0; nAt < nStriles; ++nAt)
    {
        oPage.moOffsets[nAt] = oOffsets.Get(*mpoFile, nAt);
        oPage.moByteCounts[nAt] = oCounts.Get(*mpoFile, nAt);
    }
    oPage.moRoom = oPage.moByteCounts;
    const StrileShape oShape = oPage.GetShape();
    for (std::uint64_t nAt = 0; oShape.mbOnlyStrips && nAt < nStriles; ++nAt)
    {
        const Strile oStrip = oPage.Get(nAt);
        if (oStrip.mnOffset == 0)
            continue;
        oPage.moByteCounts[nAt] = FindOnlyStripBytes(oStrip, oShape, oDirectory, oPage.moOffsets, mpoFile->GetSize());
        // Room that its directory does not claim is not given up with it.
        if (oPage.moByteCounts[nAt] != oStrip.mnBytes)
            oPage.moRoom[nAt] = 0;
    }
    // What is added to the file would otherwise be taken for what is missing.
    for (std::uint64_t nAt = 0; nAt < nStriles; ++nAt)
        if (oPage.moByteCounts[nAt] > mpoFile->GetSize() ||
            oPage.moOffsets[nAt] > mpoFile->GetSize() - oPage.moByteCounts[nAt])
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
    mpoFile->Read(oTag.moStored.mnOffset, oTag.moBytes.data(), oTag.moBytes.size());
}

void FileEditor::LoadTags(PageModel& oPage)
{
    for (Tag& oTag : oPage.moTags.EditTags())
        Load(oTag);
}

std::vector<Extent> FileEditor::ListUsed() const
{
    std::vector<Extent> oUsed = {{0, moHeader.GetBytes(), 0}};
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
            Add({poPage->moOffsets[nAt], std::max(poPage->moRoom[nAt], poPage->moByteCounts[nAt]), 0});
    }
    std::sort(oUsed.begin(), oUsed.end(),
              [](const Extent& oFirst, const Extent& oSecond) { return oFirst.mnOffset < oSecond.mnOffset; });
    return oUsed;
}

// Whether two of the pieces, which ascend, have bytes in common that this library wrote. It never does that: somebody
// else was here.
bool FileEditor::SharesOwn(const std::vector<Extent>& oPieces) const
{
    const std::vector<Extent>& oForeign = moRecord.moForeign;
    std::uint64_t nEnd = 0;
    for (const Extent& oPiece : oPieces)
    {
        if (oPiece.mnOffset < nEnd &&
            std::none_of(oForeign.begin(), oForeign.end(),
                         [&](const Extent& oPart)
                         { return oPart.mnOffset <= oPiece.mnOffset && nEnd <= GetEnd(oPart); }))
            return true;
        nEnd = std::max(nEnd, GetEnd(oPiece));
    }
    return false;
}

void FileEditor::FindUnused()
{
    Extent& oRoot = moPages.front()->moDirectory;
    const std::uint64_t nSize = mpoFile->GetSize();
    const std::optional<RoomRecord> oRecord = RoomRecord::Read(*mpoFile, oRoot.mnOffset, GetEnd(oRoot));
    moRecord = oRecord.value_or(RoomRecord());
    if (oRecord)
        oRoot.mnBytes += oRecord->GetBytes();
    // What lies behind the end that is recorded was added by somebody else, or by a writer that was killed.
    moRecord.AddForeign(moRecord.mnFileBytes, nSize - moRecord.mnFileBytes);
    std::vector<Extent> oTaken = ListUsed();
    if (SharesOwn(oTaken))
    {
        moRecord = RoomRecord();
        moRecord.AddForeign(0, nSize);
    }
    oTaken.insert(oTaken.end(), moRecord.moForeign.begin(), moRecord.moForeign.end());
    oTaken.push_back({nSize, 0, 0});
    std::sort(oTaken.begin(), oTaken.end(),
              [](const Extent& oFirst, const Extent& oSecond) { return oFirst.mnOffset < oSecond.mnOffset; });
    std::vector<Extent> oUnused;
    std::uint64_t nEnd = 0;
    for (const Extent& oPiece : oTaken)
    {
        if (oPiece.mnOffset > nEnd)
            oUnused.push_back({nEnd, oPiece.mnOffset - nEnd, 0});
        nEnd = std::max(nEnd, GetEnd(oPiece) + GetEnd(oPiece) % 2);
    }
    for (const Extent& oPiece : oUnused)
        mpoSpace->AddUnused(oPiece.mnOffset, oPiece.mnBytes);
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
    if (!RoomRecord::Read(*poFile, oRoot.GetOffset(), nEnd))
        return std::nullopt;
    return FileEditor(std::move(poFile), oHeader).GetUnusedBytes();
}

void FileEditor::Restart() noexcept
{
    moPages.clear();
    moWriters.clear();
    mpoFile.reset();
    if (!moTemporary.empty())
        std::remove(moTemporary.c_str());
    moTemporary.clear();
}

void FileEditor::CreateFile(bool bBigTiff, bool bGap)
{
    const std::string temporary = support::MakeTemporaryName(moFileName, mbReplaces);
    mpoFile = std::make_shared<support::File>(temporary, support::File::Mode::eCreate);
    moTemporary = temporary;
    mpoFile->ShowAs(moFileName);
    moHeader = FileHeader();
    moHeader.mbBigTiff = bBigTiff;
    const std::uint64_t nHeader = moHeader.GetBytes();
    UseSpace(bGap ? FIRST_BLOCK : nHeader);
    mpoSpace->AddGap(nHeader, bGap ? FIRST_BLOCK - nHeader : 0);
}

void FileEditor::UseSpace(std::uint64_t nEnd)
{
    mpoSpace = std::make_unique<support::Space>(moFileName, nEnd, moHeader.mbBigTiff ? INT64_MAX : CLASSIC_LIMIT,
                                                "the file would pass the limit of 4 GiB of classic TIFF; write it as "
                                                "BigTIFF (option BIGTIFF=YES)");
}

void FileEditor::LayOut(PageModel& oPage, const Place& oPlace) const
{
    const std::uint64_t nStriles = oPage.CountStriles();
    if (nStriles > MAXIMUM_STRILES)
        throw DataException(moFileName + ": the image would have " + std::to_string(nStriles) +
                                " strips or tiles; choose larger ones (options BLOCKXSIZE, BLOCKYSIZE)",
                            oPlace);
    oPage.SetStriles(nStriles);
}

std::shared_ptr<PageModel> FileEditor::AddFirstPage(const NewImage& oImage, const Place& oPlace)
{
    CheckWritable(oPlace);
    std::shared_ptr<PageModel> poPage = MakeImagePage(oImage, moOptions, false, oPlace);
    LayOut(*poPage, oPlace);
    const std::uint64_t nPixelBytes = oImage.moType.GetValueBits() / 8 * oImage.mnChannels;
    const std::uint64_t nPixels = std::uint64_t{oImage.mnWidth} * oImage.mnHeight;
    const std::uint64_t nBytes = nPixels > INT64_MAX / nPixelBytes ? INT64_MAX : nPixels * nPixelBytes;
    using Choice = CreateOptions::Choice;
    const bool bBig = moOptions.meBigTiff == Choice::eYes ||
                      (moOptions.meBigTiff == Choice::eAutomatic && nBytes > CLASSIC_IMAGE_LIMIT);
    if (!bBig && moOptions.mnCompression == COMPRESSION_NONE && nBytes > CLASSIC_LIMIT - DIRECTORY_RESERVE)
        throw DataException(moFileName + ": an image of " + std::to_string(nBytes) +
                                " bytes does not fit into classic TIFF (option BIGTIFF=NO)",
                            oPlace);
    CreateFile(bBig, nBytes / poPage->GetStriles() >= LARGE_BLOCK && moOptions.mnCompression == COMPRESSION_NONE);
    AddPage(poPage);
    return poPage;
}

void FileEditor::AddPage(std::shared_ptr<PageModel> poPage)
{
    CheckWritable();
    if (poPage->moOffsets.empty())
        LayOut(*poPage);
    poPage->mnNumber = mnNextNumber++;
    poPage->mbStrilesChanged = true;
    const auto oBelow = std::find_if(moPages.begin(), moPages.end(),
                                     [](const std::shared_ptr<PageModel>& poOther) { return poOther->mbBelowFirst; });
    moPages.insert(oBelow, std::move(poPage));
    mbChanged = true;
}

void FileEditor::ReleasePage(const PageModel& oPage, const PageModel* pHeir)
{
    std::unordered_set<std::uint64_t> oKept;
    for (std::size_t nAt = 0; pHeir != nullptr && nAt < pHeir->moOffsets.size(); ++nAt)
        if (pHeir->moRoom[nAt] != 0)
            oKept.insert(pHeir->moOffsets[nAt]);
    for (std::size_t nAt = 0; nAt < oPage.moOffsets.size(); ++nAt)
        if (oPage.moRoom[nAt] != 0 && !oKept.contains(oPage.moOffsets[nAt]))
            moReleased.push_back({oPage.moOffsets[nAt], oPage.moRoom[nAt], oPage.moGenerations[nAt]});
    for (const Extent& oExtent : {oPage.moDirectory, oPage.moDraft, oPage.moOffsetArray, oPage.moCountArray})
        if (oExtent.mnBytes != 0)
            moReleased.push_back(oExtent);
    for (const Tag& oTag : oPage.moTags.GetTags())
        if (oTag.moStored.mnBytes != 0)
            moReleased.push_back(oTag.moStored);
}

void FileEditor::RemovePage(std::uint64_t nNumber)
{
    CheckWritable();
    const std::shared_ptr<PageModel> poPage = GetPage(nNumber);
    ReleasePage(*poPage, nullptr);
    moPages.erase(std::find(moPages.begin(), moPages.end(), poPage));
    if (poPage->mbBelowFirst)
        moPages.front()->moTags.Touch();
    mbChanged = true;
}

void FileEditor::ReplacePage(std::shared_ptr<PageModel> poPage)
{
    CheckWritable();
    const std::shared_ptr<PageModel> poOld = GetPage(poPage->mnNumber);
    ReleasePage(*poOld, poPage.get());
    poPage->mbBelowFirst = poOld->mbBelowFirst;
    poPage->mnNext = poOld->mnNext;
    poPage->mbStrilesChanged = true;
    *std::find(moPages.begin(), moPages.end(), poOld) = std::move(poPage);
    mbChanged = true;
}

void FileEditor::Register(const std::shared_ptr<PageWriter>& poWriter)
{
    std::erase_if(moWriters, [](const std::weak_ptr<PageWriter>& poOther) { return poOther.expired(); });
    moWriters.push_back(poWriter);
}

// What the directories will take, so that blocks never use the last of a classic file's room.
std::uint64_t FileEditor::GetReserve() const
{
    std::uint64_t nBytes = DIRECTORY_RESERVE;
    for (const std::shared_ptr<PageModel>& poPage : moPages)
        nBytes += poPage->GetStriles() * 8 + 512;
    return moHeader.mbBigTiff ? 0 : nBytes;
}

void FileEditor::StoreStrile(PageModel& oPage, std::uint64_t nStrile, const unsigned char* pBytes, std::size_t nBytes)
{
    CheckWritable();
    const Extent oOld{oPage.moOffsets[nStrile], oPage.moRoom[nStrile], oPage.moGenerations[nStrile]};
    const bool bOwn = oOld.mnBytes != 0 && mpoSpace->IsFresh(oOld);
    if (bOwn && nBytes <= oOld.mnBytes)
    {
        mpoFile->Write(oOld.mnOffset, pBytes, nBytes);
        mpoSpace->Release(oOld, nBytes);
        oPage.moRoom[nStrile] = std::min<std::uint64_t>(nBytes + nBytes % 2, oOld.mnBytes);
        oPage.moByteCounts[nStrile] = nBytes;
        oPage.mbStrilesChanged = true;
        return;
    }
    const Extent oNew = mpoSpace->Allocate(nBytes, GetReserve());
    try
    {
        mpoFile->Write(oNew.mnOffset, pBytes, nBytes);
    }
    catch (...)
    {
        mpoSpace->Release(oNew);
        throw;
    }
    MoveStrile(oPage, nStrile, oOld, oNew, nBytes);
}

void FileEditor::MoveStrile(PageModel& oPage, std::uint64_t nStrile, const Extent& oOld, const Extent& oNew,
                            std::size_t nBytes)
{
    if (oOld.mnBytes != 0)
        mpoSpace->Release(oOld);
    oPage.moOffsets[nStrile] = oNew.mnOffset;
    oPage.moByteCounts[nStrile] = nBytes;
    oPage.moRoom[nStrile] = oNew.mnBytes;
    oPage.moGenerations[nStrile] = static_cast<std::uint32_t>(oNew.mnGeneration);
    oPage.mbStrilesChanged = true;
}

std::uint64_t FileEditor::OwnStrile(PageModel& oPage, std::uint64_t nStrile, std::size_t nBytes)
{
    CheckWritable();
    const Extent oOld{oPage.moOffsets[nStrile], oPage.moRoom[nStrile], oPage.moGenerations[nStrile]};
    if (oPage.moByteCounts[nStrile] == nBytes && mpoSpace->IsFresh(oOld))
        return oOld.mnOffset;
    const Extent oNew = mpoSpace->Allocate(nBytes, GetReserve());
    try
    {
        std::vector<unsigned char> oBytes(std::min(nBytes, COPY_BYTES));
        for (std::size_t nDone = 0; nDone < nBytes; nDone += oBytes.size())
        {
            oBytes.resize(std::min(nBytes - nDone, COPY_BYTES));
            const std::size_t nStored = oPage.moByteCounts[nStrile];
            const std::size_t nOld = nStored > nDone ? std::min(nStored - nDone, oBytes.size()) : 0;
            std::fill(oBytes.begin() + static_cast<std::ptrdiff_t>(nOld), oBytes.end(), static_cast<unsigned char>(0));
            if (nOld != 0)
                mpoFile->Read(oOld.mnOffset + nDone, oBytes.data(), nOld);
            mpoFile->Write(oNew.mnOffset + nDone, oBytes.data(), oBytes.size());
        }
    }
    catch (...)
    {
        mpoSpace->Release(oNew);
        throw;
    }
    MoveStrile(oPage, nStrile, oOld, oNew, nBytes);
    return oNew.mnOffset;
}

// The directory, then the values that are not in the file yet, in one piece; the arrays each in a place of their own.
FileEditor::Written FileEditor::WriteDirectory(PageModel& oPage, std::uint64_t nNext, bool bDraft)
{
    const std::size_t nWord = moHeader.mbBigTiff ? 8 : 4;
    const std::uint64_t nStriles = oPage.GetStriles();
    Written oWritten{&oPage, {}, nNext, oPage.moOffsetArray, oPage.moCountArray};

    const auto WriteArray = [&](const StrileList<std::uint64_t>& oValues, Extent& oArray)
    {
        if (nStriles * nWord <= nWord || bDraft ||
            (!oPage.mbStrilesChanged && !oPage.mbArraysStale && oArray.mnBytes != 0))
            return;
        const std::vector<unsigned char> oBytes = MakeArray(oValues, moHeader);
        oArray = mpoSpace->Allocate(oBytes.size());
        mpoFile->Write(oArray.mnOffset, oBytes.data(), oBytes.size());
    };
    WriteArray(oPage.moOffsets, oWritten.moOffsetArray);
    WriteArray(oPage.moByteCounts, oWritten.moCountArray);

    for (Tag& oTag : oPage.moTags.EditTags())
        if (oTag.GetBytes() > nWord && oTag.moStored.mnBytes == 0)
        {
            Extent oPlace = mpoSpace->Allocate(oTag.GetBytes());
            mpoFile->Write(oPlace.mnOffset, oTag.moBytes.data(), oTag.moBytes.size());
            oTag.moStored = oPlace;
        }

    // A directory that is only written ahead names no arrays: whoever reads by it knows the places.
    const std::uint64_t nNone = moHeader.GetBytes();
    std::vector<unsigned char> oBytes = MakeDirectory(oPage, moHeader, bDraft ? nNone : oWritten.moOffsetArray.mnOffset,
                                                      bDraft ? nNone : oWritten.moCountArray.mnOffset, nNext);
    const bool bRoot = !bDraft && &oPage == moPages.front().get();
    oWritten.moDirectory = mpoSpace->Allocate(oBytes.size() + (bRoot ? moRecord.GetBytes() : 0));
    if (bRoot)
    {
        moRecord.mnFileBytes = std::max(mpoFile->GetSize(), GetEnd(oWritten.moDirectory));
        const std::vector<unsigned char> oRecord = moRecord.Make(oWritten.moDirectory.mnOffset);
        oBytes.insert(oBytes.end(), oRecord.begin(), oRecord.end());
    }
    mpoFile->Write(oWritten.moDirectory.mnOffset, oBytes.data(), oBytes.size());
    return oWritten;
}

std::shared_ptr<Page> FileEditor::OpenPage(const std::shared_ptr<PageModel>& poPage)
{
    std::uint64_t nOffset = poPage->moDirectory.mnOffset;
    if (poPage->moTags.IsChanged() || nOffset == 0)
    {
        if (poPage->moDraft.mnBytes != 0)
            mpoSpace->Release(poPage->moDraft);
        poPage->moDraft = {};
        poPage->moDraft = WriteDirectory(*poPage, 0, true).moDirectory;
        nOffset = poPage->moDraft.mnOffset;
    }
    auto poOpened = std::make_shared<Page>(mpoFile, moHeader, nOffset);
    const PageForm& oForm = poOpened->GetForm();
    const PageSummary oSummary = poPage->Summarise();
    if (oForm.mnWidth != oSummary.mnWidth || oForm.mnHeight != oSummary.mnHeight ||
        oForm.mnChannels != oSummary.mnChannels || oForm.moSample.GetBits() != oSummary.mnBits ||
        oForm.mbTiled != poPage->IsTiled() || oForm.GetStriles() != poPage->GetStriles())
        Fail("a directory contradicts itself about the size of the image; it cannot be updated");
    poOpened->GetHandle(); // now: the room of a directory is used again when the page changes
    poOpened->GetStriles().Use(poPage);
    return poOpened;
}

bool FileEditor::IsChanged() const
{
    return mbChanged || std::any_of(moPages.begin(), moPages.end(),
                                    [](const std::shared_ptr<PageModel>& poPage) { return poPage->IsChanged(); });
}

bool FileEditor::HasUnsaved() const
{
    const auto Holds = [](const std::weak_ptr<PageWriter>& poWeak)
    {
        const std::shared_ptr<PageWriter> poWriter = poWeak.lock();
        return poWriter && poWriter->Holds();
    };
    return !mbEnded && HasPages() &&
           (!mbNamed || IsChanged() || std::any_of(moWriters.begin(), moWriters.end(), Holds));
}

// From the last page to the first: each names the place of the next one.
std::vector<FileEditor::Written> FileEditor::WriteDirectories()
{
    std::vector<Written> oWritten;
    try
    {
        std::vector<std::uint64_t> oBelow;
        for (const std::shared_ptr<PageModel>& poPage : moPages)
            if (poPage->mbBelowFirst)
            {
                if (poPage->IsChanged())
                    oWritten.push_back(WriteDirectory(*poPage, poPage->mnNext, false));
                oBelow.push_back(poPage->IsChanged() ? oWritten.back().moDirectory.mnOffset
                                                     : poPage->moDirectory.mnOffset);
            }
        TagList& oTags = moPages.front()->moTags;
        if (oBelow.empty() && mbBelowFirst)
            oTags.Remove(TIFFTAG_SUBIFD);
        else if (oBelow != oTags.GetNumbers(TIFFTAG_SUBIFD) && mbBelowFirst)
            oTags.SetNumbers(TIFFTAG_SUBIFD, moHeader.mbBigTiff ? TIFF_IFD8 : TIFF_IFD, oBelow);

        std::uint64_t nNext = 0;
        for (std::size_t nAt = moPages.size() - oBelow.size(); nAt-- > 0;)
        {
            PageModel& oPage = *moPages[nAt];
            const bool bWrite = oPage.IsChanged() || oPage.mnNext != nNext;
            if (bWrite)
                oWritten.push_back(WriteDirectory(oPage, nNext, false));
            nNext = bWrite ? oWritten.back().moDirectory.mnOffset : oPage.moDirectory.mnOffset;
        }
    }
    catch (...)
    {
        ReleaseWritten(oWritten);
        throw;
    }
    return oWritten;
}

void FileEditor::ReleaseWritten(const std::vector<Written>& oWritten)
{
    for (const Written& oDirectory : oWritten)
        for (const Extent& oExtent : {oDirectory.moDirectory, oDirectory.moOffsetArray, oDirectory.moCountArray})
            if (oExtent.mnBytes != 0 && mpoSpace->IsFresh(oExtent))
                mpoSpace->Release(oExtent);
}

void FileEditor::StoreHeld()
{
    for (const std::weak_ptr<PageWriter>& poWeak : moWriters)
        if (const std::shared_ptr<PageWriter> poWriter = poWeak.lock())
            poWriter->Flush();
}

void FileEditor::Synchronize()
{
    CheckWritable();
    StoreHeld();
    if (!HasPages())
        return;
    if (IsChanged())
        Commit(WriteDirectories());
    if (moTemporary.empty())
        return;
    mpoFile->Rename(moFileName, mbReplaces);
    moTemporary.clear();
    mbNamed = true;
}

// Whether a new, small file holds a good deal of what was given up again while it was made: directories above all.
bool FileEditor::IsWasteful() const
{
    if (moTemporary.empty() || mpoFile->GetSize() > SMALL_FILE)
        return false;
    std::uint64_t nUsed = 0;
    for (const Extent& oPiece : ListUsed())
        nUsed += oPiece.mnBytes;
    return mpoFile->GetSize() > nUsed + nUsed / 20;
}

// A file that is to be laid out for a network gets its order at the very end, and so does one that would be larger than
// it need be: a second temporary file takes its place.
void FileEditor::Finish()
{
    CheckWritable();
    StoreHeld();
    if (HasPages() && IsChanged())
        Commit(WriteDirectories());
    if (!HasPages() || (!moOptions.mbCloud && !IsWasteful()))
    {
        Synchronize();
        // What was written to look at the file since then is of no more use.
        if (HasPages())
            mpoFile->CutBack(mnCommittedSize);
        return;
    }
    for (const std::shared_ptr<PageModel>& poPage : moPages)
        LoadTags(*poPage);
    // Only the file that has got the name is replaced by its better form.
    if (mbNamed)
        mpoFile->Flush();
    const std::string laidOut = support::MakeTemporaryName(moFileName, mbNamed || mbReplaces);
    try
    {
        support::File oTarget(laidOut, support::File::Mode::eCreate);
        oTarget.ShowAs(moFileName);
        WriteCloudLayout(moPages, moHeader, *mpoFile, oTarget, moOptions.mbCloud);
        oTarget.Flush();
        oTarget.Rename(moFileName, mbNamed || mbReplaces);
    }
    catch (...)
    {
        std::remove(laidOut.c_str());
        throw;
    }
    if (!moTemporary.empty())
        std::remove(moTemporary.c_str());
    moTemporary.clear();
    mbNamed = true;
}

// Pages that came and went again leave nothing to be written.
void FileEditor::Commit(const std::vector<Written>& oWritten)
{
    if (!oWritten.empty())
        Publish(oWritten);
    for (const std::shared_ptr<PageModel>& poPage : moPages)
        for (const Extent& oExtent : poPage->moTags.TakeReleased())
            mpoSpace->Release(oExtent);
    for (const Extent& oExtent : std::exchange(moReleased, {}))
        mpoSpace->Release(oExtent);
    mbChanged = false;
    // Nobody reads what has no name yet.
    if (!oWritten.empty())
        mpoSpace->Reuse(moTemporary.empty() ? mpoFile->FindHeld() : support::Space::Roots(std::in_place));
}

// What was written reaches the disk before the one number that makes it the file's, and that before anything of the
// former state is given up.
void FileEditor::Publish(const std::vector<Written>& oWritten)
{
    const Written& oFirst = oWritten.back();
    const bool bFirst = oFirst.mpPage == moPages.front().get();
    try
    {
        mpoFile->Flush();
    }
    catch (...)
    {
        ReleaseWritten(oWritten);
        throw;
    }
    mnCommittedSize = mpoFile->GetSize();
    moHeader.mnFirstDirectory = bFirst ? oFirst.moDirectory.mnOffset : moPages.front()->moDirectory.mnOffset;
    mpoSpace->Age(moHeader.mnFirstDirectory);
    unsigned char aHeader[FileHeader::BYTES] = {};
    moHeader.Write(aHeader, moHeader.mnFirstDirectory);
    const std::size_t nPlace = moHeader.mbBigTiff ? 8 : 4;
    const bool bNew = !moTemporary.empty();
    mpoFile->Write(bNew ? 0 : nPlace, aHeader + (bNew ? 0 : nPlace), moHeader.GetBytes() - (bNew ? 0 : nPlace));
    mpoFile->Flush();

    for (const Written& oDirectory : oWritten)
        Adopt(oDirectory);
}

void FileEditor::Adopt(const Written& oWritten)
{
    PageModel& oPage = *oWritten.mpPage;
    const auto Replace = [this](Extent& oOld, const Extent& oNew)
    {
        if (oOld.mnBytes != 0 && oOld.mnOffset != oNew.mnOffset)
            mpoSpace->Release(oOld);
        oOld = oNew;
    };
    Replace(oPage.moDirectory, oWritten.moDirectory);
    Replace(oPage.moOffsetArray, oWritten.moOffsetArray);
    Replace(oPage.moCountArray, oWritten.moCountArray);
    Replace(oPage.moDraft, {});
    oPage.mnNext = oWritten.mnNext;
    oPage.mbStrilesChanged = false;
    oPage.mbArraysStale = false;
    oPage.moTags.Settle();
}

} // namespace krv::plugins::tif
