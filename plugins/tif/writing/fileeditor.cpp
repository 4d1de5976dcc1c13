#include "plugins/tif/writing/fileeditor.h"

#include "plugins/support/file/copypieces.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
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
constexpr std::size_t COPY_BYTES = std::size_t{1} << 20;

} // namespace

FileEditor::FileEditor(const std::string& fileName, const CreateOptions& oOptions)
    : FileWriter(fileName), moOptions(oOptions)
{
}

FileEditor::~FileEditor()
{
    Discard();
}

void FileEditor::Discard() noexcept
{
    if (!IsEnded() && IsNamed())
        GetFile()->CutBack(mnCommittedSize);
    FileWriter::Discard();
}

void FileEditor::Fail(const std::string& what, const Place& oPlace) const
{
    throw FileFormatException(GetFileName(), GetFileName() + ": " + what, oPlace);
}

const std::shared_ptr<PageModel>& FileEditor::GetPage(std::uint64_t nNumber, const Place& oPlace) const
{
    const auto oFound =
        std::find_if(moPages.begin(), moPages.end(),
                     [nNumber](const std::shared_ptr<PageModel>& poPage) { return poPage->mnNumber == nNumber; });
    if (oFound == moPages.end())
        throw DataException(GetFileName() + ": the page is no longer there", oPlace);
    return *oFound;
}

std::vector<PageSummary> FileEditor::Summarise() const
{
    std::vector<PageSummary> oSummaries;
    for (const std::shared_ptr<PageModel>& poPage : moPages)
        oSummaries.push_back(poPage->Summarise());
    return oSummaries;
}

void FileEditor::Restart() noexcept
{
    moPages.clear();
    moWriters.clear();
    RemoveFile();
}

void FileEditor::CreateFile(bool bBigTiff, bool bGap)
{
    MakeFile();
    moHeader = FileHeader();
    moHeader.mbBigTiff = bBigTiff;
    const std::uint64_t nHeader = moHeader.GetBytes();
    UseSpace(bGap ? FIRST_BLOCK : nHeader);
    mpoSpace->AddGap(nHeader, bGap ? FIRST_BLOCK - nHeader : 0);
}

void FileEditor::UseSpace(std::uint64_t nEnd)
{
    mpoSpace = std::make_unique<support::Space>(GetFileName(), nEnd, moHeader.mbBigTiff ? INT64_MAX : CLASSIC_LIMIT,
                                                "the file would pass the limit of 4 GiB of classic TIFF; write it as "
                                                "BigTIFF (option BIGTIFF=YES)");
}

void FileEditor::LayOut(PageModel& oPage, const Place& oPlace) const
{
    const std::uint64_t nStriles = oPage.CountStriles();
    if (nStriles > MAXIMUM_STRILES)
        throw DataException(GetFileName() + ": the image would have " + std::to_string(nStriles) +
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
        throw DataException(GetFileName() + ": an image of " + std::to_string(nBytes) +
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
        GetFile()->Write(oOld.mnOffset, pBytes, nBytes);
        mpoSpace->Release(oOld, nBytes);
        oPage.moRoom[nStrile] = std::min<std::uint64_t>(nBytes + nBytes % 2, oOld.mnBytes);
        oPage.moByteCounts[nStrile] = nBytes;
        oPage.mbStrilesChanged = true;
        return;
    }
    const Extent oNew = mpoSpace->Allocate(nBytes, GetReserve());
    try
    {
        GetFile()->Write(oNew.mnOffset, pBytes, nBytes);
    }
    catch (...)
    {
        mpoSpace->Release(oNew);
        throw;
    }
    MoveStrile(oPage, nStrile, oOld, oNew, nBytes);
}

void FileEditor::CopyStriles(PageModel& oPage, const support::File& oSource, const std::vector<CodedStrile>& oStriles)
{
    CheckWritable();
    const std::uint64_t nReserve = GetReserve();
    std::vector<Extent> oPlaces;
    std::vector<support::CopiedPiece> oPieces;
    oPlaces.reserve(oStriles.size());
    try
    {
        for (const CodedStrile& oStrile : oStriles)
        {
            oPlaces.push_back(mpoSpace->Allocate(oStrile.mnBytes, nReserve));
            oPieces.push_back({oStrile.mnOffset, oPlaces.back().mnOffset, oStrile.mnBytes});
        }
        support::CopyPieces(oSource, *GetFile(), std::move(oPieces), moScratch);
    }
    catch (...)
    {
        for (const Extent& oPlace : oPlaces)
            mpoSpace->Release(oPlace);
        throw;
    }
    for (std::size_t n = 0; n < oStriles.size(); ++n)
    {
        const std::uint64_t nStrile = oStriles[n].mnNumber;
        const Extent oOld{oPage.moOffsets[nStrile], oPage.moRoom[nStrile], oPage.moGenerations[nStrile]};
        MoveStrile(oPage, nStrile, oOld, oPlaces[n], oStriles[n].mnBytes);
    }
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
                GetFile()->Read(oOld.mnOffset + nDone, oBytes.data(), nOld);
            GetFile()->Write(oNew.mnOffset + nDone, oBytes.data(), oBytes.size());
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
    auto poOpened = std::make_shared<Page>(GetFile(), moHeader, nOffset);
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

} // namespace krv::plugins::tif
