// FileEditor: how changes become the file's.
#include "plugins/support/file/copypieces.h"
#include "plugins/tif/reading/cloudheader.h"
#include "plugins/tif/writing/directorybytes.h"
#include "plugins/tif/writing/fileeditor.h"
#include "plugins/tif/writing/pagewriter.h"

#include <algorithm>
#include <span>
#include <utility>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

// A file up to this size costs little to be written twice.
constexpr std::uint64_t SMALL_FILE = std::uint64_t{4} << 20;
constexpr std::size_t COPIED_PIECES = 4096;
// The disk writes so many while the next ones are copied.
constexpr std::uint64_t COPIED_BYTES = std::uint64_t{32} << 20;

// A page with the places that it gets.
struct Placed
{
    PageModel moPage;
    const PageModel* mpOld;
    Extent moOffsetArray;
    Extent moCountArray;
};

std::uint64_t GetPixels(const PageModel& oPage)
{
    return oPage.moTags.GetNumber(TIFFTAG_IMAGEWIDTH, 0) * oPage.moTags.GetNumber(TIFFTAG_IMAGELENGTH, 0);
}

bool HasShortBlocks(const std::shared_ptr<PageModel>& poPage)
{
    for (std::size_t nAt = 0; nAt < poPage->GetStriles(); ++nAt)
        if (poPage->moByteCounts[nAt] > UINT32_MAX)
            return false;
    return true;
}

std::vector<Placed> ToPlace(const std::vector<std::shared_ptr<PageModel>>& oPages)
{
    std::vector<Placed> oPlaced;
    for (const std::shared_ptr<PageModel>& poPage : oPages)
        oPlaced.push_back({*poPage, poPage.get(), {}, {}});
    return oPlaced;
}

// The image, its masks, and the levels from large to small.
void Sort(std::vector<Placed>& oSorted)
{
    std::stable_sort(oSorted.begin() + 1, oSorted.end(),
                     [](const Placed& oFirst, const Placed& oSecond)
                     { return GetPixels(oFirst.moPage) > GetPixels(oSecond.moPage); });
}

bool IsStored(const PageModel& oPage, std::size_t nBlock)
{
    return oPage.moByteCounts[nBlock] != 0;
}

// Whether a page is the mask of an image, in blocks of the same places, and no block of the image is without one.
bool IsMaskOf(const PageModel& oMask, const PageModel& oImage)
{
    const auto IsMask = [](const PageModel& oPage)
    {
        return (oPage.moTags.GetNumber(TIFFTAG_SUBFILETYPE, 0) & FILETYPE_MASK) != 0;
    };
    if (!IsMask(oMask) || IsMask(oImage) || oMask.GetStriles() != oImage.GetStriles())
        return false;
    for (const std::uint16_t nTag : {TIFFTAG_IMAGEWIDTH, TIFFTAG_IMAGELENGTH, TIFFTAG_TILEWIDTH, TIFFTAG_TILELENGTH})
        if (oMask.moTags.GetNumber(nTag, 0) != oImage.moTags.GetNumber(nTag, 0))
            return false;
    for (std::size_t nAt = 0; nAt < oImage.GetStriles(); ++nAt)
        if (IsStored(oImage, nAt) && !IsStored(oMask, nAt))
            return false;
    return true;
}

// Whether the image and each level is followed by its mask.
bool AreInPairs(const std::vector<Placed>& oSorted)
{
    for (std::size_t nAt = 0; nAt < oSorted.size(); nAt += 2)
        if (nAt + 1 == oSorted.size() || !IsMaskOf(oSorted[nAt + 1].moPage, oSorted[nAt].moPage))
            return false;
    return true;
}

void PlaceDirectory(Placed& oPlaced, const FileHeader& oHeader, std::uint64_t nBehind, support::Space& oSpace)
{
    const std::size_t nWord = oHeader.mbBigTiff ? 8 : 4;
    PageModel& oPage = oPlaced.moPage;
    oPage.moDirectory = oSpace.Allocate(GetDirectoryBytes(oPage, oHeader) + nBehind);
    for (Tag& oTag : oPage.moTags.EditTags())
        if (oTag.GetBytes() > nWord)
            oTag.moStored = oSpace.Allocate(oTag.GetBytes());
    if (oPage.GetStriles() < 2)
        return;
    oPlaced.moOffsetArray = oSpace.Allocate(oPage.GetStriles() * nWord);
    oPlaced.moCountArray = oSpace.Allocate(oPage.GetStriles() * nWord);
}

// Writes in front of a block how long it is, and behind it its last bytes once more: clients that read it with its
// neighbours see so where it ends, and whether they have all of it.
void Enclose(const support::CopiedPiece& oBlock, support::File& oTarget)
{
    std::vector<unsigned char> oLeader;
    support::AppendNumber(oLeader, oBlock.mnBytes, CloudHeader::LEADER_BYTES, false);
    oTarget.Write(oBlock.mnTo - oLeader.size(), oLeader.data(), oLeader.size());
    unsigned char aTrailer[CloudHeader::TRAILER_BYTES] = {};
    const auto nLast = std::min<std::uint64_t>(oBlock.mnBytes, sizeof(aTrailer));
    const std::uint64_t nEnd = oBlock.mnTo + oBlock.mnBytes;
    oTarget.Read(nEnd - nLast, aTrailer + sizeof(aTrailer) - nLast, nLast);
    oTarget.Write(nEnd, aTrailer, sizeof(aTrailer));
}

// A block that masks go with: its room in the file holds theirs, which follow it without a gap.
void PlaceBlocks(std::span<Placed> oPages, std::size_t nAt, bool bEnclosed, support::Space& oSpace,
                 std::vector<support::CopiedPiece>& oPieces)
{
    const std::uint64_t nBefore = bEnclosed ? CloudHeader::LEADER_BYTES : 0;
    const std::uint64_t nAround = bEnclosed ? nBefore + CloudHeader::TRAILER_BYTES : 0;
    std::uint64_t nRoom = 0;
    for (const Placed& oPlaced : oPages)
        nRoom += IsStored(oPlaced.moPage, nAt) ? oPlaced.moPage.moByteCounts[nAt] + nAround : 0;
    std::uint64_t nNext = nRoom == 0 ? 0 : oSpace.Allocate(nRoom).mnOffset;
    for (Placed& oPlaced : oPages)
    {
        const std::uint64_t nBytes = oPlaced.moPage.moByteCounts[nAt];
        oPlaced.moPage.moOffsets[nAt] = nBytes == 0 ? 0 : nNext + nBefore;
        if (nBytes == 0)
            continue;
        oPieces.push_back({oPlaced.mpOld->moOffsets[nAt], nNext + nBefore, nBytes});
        nNext += nBytes + nAround;
    }
}

// oPages: an image, or an image and its mask.
void CopyBlocks(std::span<Placed> oPages, const support::File& oSource, support::Space& oSpace, support::File& oTarget,
                bool bEnclosed, support::Scratch& oScratch, const support::Copied& oCopied)
{
    const std::size_t nBlocks = oPages.front().moPage.GetStriles();
    std::vector<support::CopiedPiece> oPieces;
    for (std::size_t nAt = 0; nAt < nBlocks; ++nAt)
    {
        PlaceBlocks(oPages, nAt, bEnclosed, oSpace, oPieces);
        const std::uint64_t nWaiting =
            oPieces.empty() ? 0 : oPieces.back().mnTo + oPieces.back().mnBytes - oPieces.front().mnTo;
        if (oPieces.size() < COPIED_PIECES && nWaiting < COPIED_BYTES && nAt + 1 < nBlocks)
            continue;
        const std::uint64_t nFrom = oTarget.GetSize();
        support::CopyPieces(oSource, oTarget, oPieces, oScratch, oCopied);
        for (const support::CopiedPiece& oPiece : oPieces)
            if (bEnclosed)
                Enclose(oPiece, oTarget);
        oPieces.clear();
        oTarget.BeginFlush(nFrom, oTarget.GetSize() - nFrom);
    }
}

void WriteDirectory(const Placed& oPlaced, const FileHeader& oHeader, std::uint64_t nNext, support::File& oTarget)
{
    const auto Write = [&oTarget](const Extent& oPlace, const std::vector<unsigned char>& oBytes)
    {
        if (oPlace.mnBytes != 0)
            oTarget.Write(oPlace.mnOffset, oBytes.data(), oBytes.size());
    };
    const PageModel& oPage = oPlaced.moPage;
    Write(oPage.moDirectory,
          MakeDirectory(oPage, oHeader, oPlaced.moOffsetArray.mnOffset, oPlaced.moCountArray.mnOffset, nNext));
    for (const Tag& oTag : oPage.moTags.GetTags())
        Write(oTag.moStored, oTag.moBytes);
    Write(oPlaced.moOffsetArray, MakeArray(oPage.moOffsets, oHeader));
    Write(oPlaced.moCountArray, MakeArray(oPage.moByteCounts, oHeader));
}

// Writes a file anew so that it can be read in few requests over a network: the header, all directories with their
// values, the image first and its levels from large to small, and then the blocks, those of the smallest level first
// and in each page in their order, each with that of its mask where every image has one and the same blocks. Blocks are
// copied as they are stored. bCloud: with the text that tells clients so; otherwise pages stay in their order. oPages:
// of the chain, their tags in memory; the first is the image. oCopied: may be empty.
void WriteCloudLayout(const std::vector<std::shared_ptr<PageModel>>& oPages, const FileHeader& oHeader,
                      const support::File& oSource, support::File& oTarget, bool bCloud, const support::Copied& oCopied)
{
    std::vector<Placed> oSorted = ToPlace(oPages);
    if (bCloud)
        Sort(oSorted);
    // A block that is longer than a leader can say has none, and so have all others.
    const bool bEnclosed = bCloud && std::all_of(oPages.begin(), oPages.end(), &HasShortBlocks);
    const bool bRowMajor =
        std::all_of(oPages.begin(), oPages.end(),
                    [](const auto& poPage) { return poPage->moTags.GetNumber(TIFFTAG_PLANARCONFIG, 1) == 1; });
    const std::size_t nTogether = bEnclosed && AreInPairs(oSorted) ? 2 : 1;
    const std::string text = bEnclosed ? CloudHeader::Make(bRowMajor, nTogether == 2) : std::string();
    support::Space oSpace(oTarget.GetName(), oHeader.GetBytes() + text.size(),
                          oHeader.mbBigTiff ? INT64_MAX : UINT32_MAX,
                          "the file would pass the limit of 4 GiB of classic TIFF");
    for (Placed& oPlaced : oSorted)
        PlaceDirectory(oPlaced, oHeader, &oPlaced == oSorted.data() ? support::RoomRecord::GetBytes(0) : 0, oSpace);
    support::Scratch oScratch;
    for (std::size_t nEnd = oSorted.size(); nEnd != 0; nEnd -= nTogether)
        CopyBlocks({&oSorted[nEnd - nTogether], nTogether}, oSource, oSpace, oTarget, bEnclosed, oScratch, oCopied);
    for (std::size_t nAt = 0; nAt < oSorted.size(); ++nAt)
        WriteDirectory(oSorted[nAt], oHeader,
                       nAt + 1 < oSorted.size() ? oSorted[nAt + 1].moPage.moDirectory.mnOffset : 0, oTarget);
    // All of the file was written here.
    const Extent& oRoot = oSorted.front().moPage.moDirectory;
    const std::uint64_t nRecord = oRoot.mnOffset + GetDirectoryBytes(oSorted.front().moPage, oHeader);
    support::RoomRecord oRecord;
    oRecord.mnFileBytes = std::max(oTarget.GetSize(), nRecord + oRecord.GetBytes());
    oTarget.Write(nRecord, oRecord.Make(oRoot.mnOffset).data(), oRecord.GetBytes());
    unsigned char aHeader[FileHeader::BYTES] = {};
    oHeader.Write(aHeader, oSorted.front().moPage.moDirectory.mnOffset);
    oTarget.Write(oHeader.GetBytes(), reinterpret_cast<const unsigned char*>(text.data()), text.size());
    oTarget.Write(0, aHeader, oHeader.GetBytes());
}

} // namespace

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
        GetFile()->Write(oArray.mnOffset, oBytes.data(), oBytes.size());
    };
    WriteArray(oPage.moOffsets, oWritten.moOffsetArray);
    WriteArray(oPage.moByteCounts, oWritten.moCountArray);

    for (Tag& oTag : oPage.moTags.EditTags())
        if (oTag.GetBytes() > nWord && oTag.moStored.mnBytes == 0)
        {
            Extent oPlace = mpoSpace->Allocate(oTag.GetBytes());
            GetFile()->Write(oPlace.mnOffset, oTag.moBytes.data(), oTag.moBytes.size());
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
        moRecord.mnFileBytes = std::max(GetFile()->GetSize(), oWritten.moDirectory.GetEnd());
        const std::vector<unsigned char> oRecord = moRecord.Make(oWritten.moDirectory.mnOffset);
        oBytes.insert(oBytes.end(), oRecord.begin(), oRecord.end());
    }
    GetFile()->Write(oWritten.moDirectory.mnOffset, oBytes.data(), oBytes.size());
    return oWritten;
}

bool FileEditor::IsChanged() const
{
    return mbChanged || std::any_of(moPages.begin(), moPages.end(),
                                    [](const std::shared_ptr<PageModel>& poPage) { return poPage->IsChanged(); });
}

bool FileEditor::HoldsChanges() const
{
    const auto Holds = [](const std::weak_ptr<PageWriter>& poWeak)
    {
        const std::shared_ptr<PageWriter> poWriter = poWeak.lock();
        return poWriter && poWriter->Holds();
    };
    return IsChanged() || std::any_of(moWriters.begin(), moWriters.end(), Holds);
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

void FileEditor::Store()
{
    StoreHeld();
    if (IsChanged())
        Commit(WriteDirectories());
}

// Whether a new, small file holds a good deal of what was given up again while it was made: directories above all.
bool FileEditor::IsWasteful() const
{
    if (IsNamed() || GetFile()->GetSize() > SMALL_FILE)
        return false;
    std::uint64_t nUsed = 0;
    for (const Extent& oPiece : ListUsed())
        nUsed += oPiece.mnBytes;
    return GetFile()->GetSize() > nUsed + nUsed / 20;
}

// A file that is to be laid out for a network gets its order at the very end, and so does one that would be larger than
// it need be: a second temporary file takes its place.
void FileEditor::Finish()
{
    CheckWritable();
    if (!HasFile())
        return End();
    // A file that has no name yet and gets its order anew need not reach the disk before that.
    const bool bOnlyLaidOut = moOptions.mbCloud && !IsNamed();
    if (bOnlyLaidOut)
        StoreHeld();
    else
        Store();
    if (!moOptions.mbCloud && !IsWasteful())
    {
        Synchronize();
        // What was written to look at the file since then is of no more use.
        GetFile()->CutBack(mnCommittedSize);
        return End();
    }
    for (const std::shared_ptr<PageModel>& poPage : moPages)
        LoadTags(*poPage);
    // Only the file that has got the name is replaced by its better form.
    if (IsNamed())
        GetFile()->Flush();
    const support::Copied oCopied = WatchPart(GetFile()->GetSize());
    StoreAnew([&](support::File& oLaidOut)
              { WriteCloudLayout(moPages, moHeader, *GetFile(), oLaidOut, moOptions.mbCloud, oCopied); });
    End();
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
        mpoSpace->Reuse(IsNamed() ? GetFile()->FindHeld() : support::Space::Roots(std::in_place));
}

// The file's own text says that what it promised does not hold any more, before the first change becomes the file's.
void FileEditor::MarkChanged()
{
    if (mnCloudBytes == 0 || mbMarked)
        return;
    const std::optional<CloudHeader> oCloud = CloudHeader::Read(*GetFile(), moHeader);
    if (oCloud && !oCloud->mbChanged)
    {
        const std::string marked = CloudHeader::MarkChanged(oCloud->moText);
        GetFile()->Write(moHeader.GetBytes(), reinterpret_cast<const unsigned char*>(marked.data()), marked.size());
    }
    mbMarked = true;
}

// What was written reaches the disk before the one number that makes it the file's, and that before anything of the
// former state is given up. A new file is nobody's until it has its name: all of it reaches the disk at once.
void FileEditor::Publish(const std::vector<Written>& oWritten)
{
    const Written& oFirst = oWritten.back();
    const bool bFirst = oFirst.mpPage == moPages.front().get();
    const bool bNew = !IsNamed();
    try
    {
        MarkChanged();
        if (!bNew)
            GetFile()->Flush(GetWatch());
    }
    catch (...)
    {
        ReleaseWritten(oWritten);
        throw;
    }
    mnCommittedSize = GetFile()->GetSize();
    moHeader.mnFirstDirectory = bFirst ? oFirst.moDirectory.mnOffset : moPages.front()->moDirectory.mnOffset;
    mpoSpace->Age(moHeader.mnFirstDirectory);
    unsigned char aHeader[FileHeader::BYTES] = {};
    moHeader.Write(aHeader, moHeader.mnFirstDirectory);
    const std::size_t nPlace = moHeader.mbBigTiff ? 8 : 4;
    GetFile()->Write(bNew ? 0 : nPlace, aHeader + (bNew ? 0 : nPlace), moHeader.GetBytes() - (bNew ? 0 : nPlace));
    GetFile()->Flush(bNew ? GetWatch() : support::File::Watch());

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
