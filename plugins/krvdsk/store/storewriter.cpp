#include "plugins/krvdsk/store/storewriter.h"

#include "plugins/support/codec/checksum.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace krv::plugins::krvdsk
{

namespace
{

// Files keep up to a part of this as room for what is to come.
constexpr std::uint64_t KEPT_ROOM_PART = 32;
constexpr std::uint64_t LARGEST_GENERATION = std::uint64_t{1} << 61;
// A file whose tiles were all moved once may want a second look: what moved made room as well.
constexpr int COMPACTIONS = 3;
// How far behind the end that a file is to have records may come to lie, at first.
constexpr std::uint64_t LITTLE_ROOM = std::uint64_t{64} << 10;
// Moved without asking whether so much was written.
constexpr std::uint64_t LITTLE_BYTES = std::uint64_t{64} << 20;

// What is copied from file to file at a time lies in the processor's second cache still.
constexpr std::uint64_t COPIED_BYTES = std::uint64_t{256} << 10;

// The disk is told to begin with so many at a time.
constexpr std::uint64_t BEGUN_BYTES = std::uint64_t{1} << 20;

} // namespace

ITileHolder::~ITileHolder() = default;

StoreWriter::StoreWriter(const std::string& fileName, const Catalogue& oDefaults)
    : FileWriter(fileName), moCatalogue(oDefaults)
{
}

StoreWriter::StoreWriter(std::shared_ptr<support::File> poFile) : FileWriter(std::move(poFile))
{
    const Root oRoot = Root::Read(*GetFile());
    mpoStore = std::make_shared<StoreFile>(GetFile(), oRoot);
    if (oRoot.mnRevision > FORMAT_REVISION)
        mpoStore->Fail("was written by a later program (revision " + std::to_string(oRoot.mnRevision) +
                       " of the format, this one knows " + std::to_string(FORMAT_REVISION) +
                       "); it can be read, not updated");
    if (oRoot.mnGeneration >= LARGEST_GENERATION)
        mpoStore->Fail("its state has an impossible number");
    mnNextGeneration = oRoot.mnGeneration + 1;
    moDirectory = oRoot.moDirectory;
    moCatalogue = Catalogue::Read(*mpoStore, mpoStore->Read(moDirectory, "the directory"));
    FindUsed();
}

StoreWriter::~StoreWriter()
{
    Discard();
}

void StoreWriter::Discard() noexcept
{
    if (!IsEnded() && IsNamed() && HasFile())
        GetFile()->CutBack(mnCommittedSize);
    FileWriter::Discard();
}

void StoreWriter::UseSpace(std::uint64_t nEnd)
{
    mpoSpace = std::make_unique<support::Space>(GetFileName(), nEnd, INT64_MAX, "the file would be too large");
}

void StoreWriter::ForEachTable(const std::function<void(TileTable& oTable)>& oAction) const
{
    for (const std::shared_ptr<Plane>& poPlane : moCatalogue.GetLevelPlanes())
        for (const auto& [nLevel, poTable] : poPlane->moTables)
            oAction(*poTable);
    for (const auto& [nNumber, oSegment] : moCatalogue.moSegments)
        if (oSegment.mpoPlane)
            for (const auto& [nLevel, poTable] : oSegment.mpoPlane->moTables)
                oAction(*poTable);
}

// All that the directory does not name is unused. Pieces that share bytes are refused: giving one up would harm the
// other.
void StoreWriter::FindUsed()
{
    std::vector<support::Extent> oUsed = {{0, Root::FIRST_PIECE, 0}};
    const std::uint64_t nMost = mpoStore->GetEnd() / Entry::BYTES + 2;
    const auto Add = [&](const Entry& oEntry, const std::string& what)
    {
        mpoStore->CheckPlace(oEntry, what);
        oUsed.push_back({oEntry.mnOffset, std::uint64_t{oEntry.mnBytes}, 0});
        if (oUsed.size() > nMost)
            mpoStore->Fail("its index names more pieces than the file has room for; it cannot be updated");
    };
    Add(moDirectory, "the directory");
    if (moCatalogue.moRecord.moEntry.IsStored())
        Add(moCatalogue.moRecord.moEntry, "the record of metadata");
    for (const auto& [nNumber, oSegment] : moCatalogue.moSegments)
        if (oSegment.moBytes.moEntry.IsStored())
            Add(oSegment.moBytes.moEntry, oSegment.Describe(nNumber));
    ForEachTable(
        [&](TileTable& oTable)
        {
            oTable.ForEach(*mpoStore, false,
                           [&](TileTable::Tile& oTile, std::uint64_t) { Add(oTile.moEntry, oTable.Describe()); });
        });
    std::sort(oUsed.begin(), oUsed.end(),
              [](const support::Extent& oFirst, const support::Extent& oSecond)
              { return oFirst.mnOffset < oSecond.mnOffset; });
    for (std::size_t nAt = 1; nAt < oUsed.size(); ++nAt)
        if (oUsed[nAt].mnOffset < oUsed[nAt - 1].GetEnd())
            mpoStore->Fail("is damaged: two of its pieces share the bytes at offset " +
                           std::to_string(oUsed[nAt].mnOffset) + "; it cannot be updated");
    // What a killed writer left behind the end may be what a reader of an older state needs.
    const std::uint64_t nEnd = std::max(mpoStore->GetEnd(), GetFile()->GetSize());
    UseSpace(nEnd);
    mpoSpace->AddUnusedBetween(std::move(oUsed), nEnd);
    mpoSpace->Age(mpoStore->GetRoot().mnGeneration);
    mnCommittedSize = GetFile()->GetSize();
}

void StoreWriter::LayOut()
{
    MakeFile();
    UseSpace(Root::FIRST_TILE);
    mpoSpace->AddGap(Root::FIRST_PIECE, Root::FIRST_TILE - Root::FIRST_PIECE);
    std::vector<unsigned char> oHeader(Root::FIRST_PIECE);
    std::copy(SIGNATURE.begin(), SIGNATURE.end(), oHeader.begin());
    GetFile()->Write(0, oHeader.data(), oHeader.size());
    Root oRoot;
    oRoot.mnFileBytes = oHeader.size();
    mpoStore = std::make_shared<StoreFile>(GetFile(), oRoot);
    moCatalogue.Describe();
    mbChanged = true;
}

void StoreWriter::Restart() noexcept
{
    mpoStore.reset();
    RemoveFile();
}

support::Extent StoreWriter::WritePiece(const void* pBytes, std::size_t nBytes)
{
    std::optional<support::Extent> oLow;
    for (std::uint64_t nSlack = 0; mnBound != 0 && !oLow && mnBound + nSlack < mpoStore->GetEnd();
         nSlack = std::max(LITTLE_ROOM, 2 * nSlack))
        oLow = mpoSpace->AllocateBefore(nBytes, mnBound + nSlack);
    const support::Extent oRoom = oLow ? *oLow : mpoSpace->Allocate(nBytes);
    try
    {
        GetFile()->Write(oRoom.mnOffset, pBytes, nBytes);
    }
    catch (...)
    {
        mpoSpace->Release(oRoom);
        throw;
    }
    mpoStore->SetEnd(std::max(mpoStore->GetEnd(), oRoom.mnOffset + nBytes));
    mnWritten += nBytes;
    if (mbOften)
        BeginFlush(oRoom);
    return oRoom;
}

// Whoever synchronises often waits for the disk each time: it begins with the pieces as they come.
void StoreWriter::BeginFlush(const support::Extent& oPiece)
{
    const bool bNext = oPiece.mnOffset == moUnflushed.GetEnd();
    const auto Begin = [this]
    {
        if (moUnflushed.mnBytes != 0)
            GetFile()->BeginFlush(moUnflushed.mnOffset, moUnflushed.mnBytes);
    };
    if (bNext)
        moUnflushed.mnBytes += oPiece.mnBytes;
    else
    {
        Begin();
        moUnflushed = oPiece;
    }
    if (moUnflushed.mnBytes < BEGUN_BYTES)
        return;
    Begin();
    moUnflushed = {oPiece.GetEnd(), 0, 0};
}

void StoreWriter::Release(const Entry& oEntry, std::uint64_t nGeneration)
{
    if (oEntry.IsStored())
        mpoSpace->Release({oEntry.mnOffset, std::uint64_t{oEntry.mnBytes} + oEntry.mnBytes % 2, nGeneration});
}

void StoreWriter::Replace(Entry& oEntry, std::uint64_t& nGeneration, const std::vector<unsigned char>& oBytes)
{
    const support::Extent oRoom = WritePiece(oBytes.data(), oBytes.size());
    Release(oEntry, nGeneration);
    oEntry = {oRoom.mnOffset, static_cast<std::uint32_t>(oBytes.size()),
              codec::Checksum(0, oBytes.data(), oBytes.size())};
    nGeneration = oRoom.mnGeneration;
}

void StoreWriter::WriteTile(TileTable& oTable, std::uint64_t nTile, const unsigned char* pBytes, std::size_t nBytes)
{
    CheckWritable();
    const TileTable::Tile* const pOld = oTable.Find(*mpoStore, nTile);
    const TileTable::Tile oOld = pOld == nullptr ? TileTable::Tile() : *pOld;
    const support::Extent oRoom = WritePiece(pBytes, nBytes);
    const std::uint32_t nChecksum = codec::Checksum(0, pBytes, nBytes);
    try
    {
        oTable.Set(*mpoStore, nTile,
                   {{oRoom.mnOffset, static_cast<std::uint32_t>(nBytes), nChecksum}, oRoom.mnGeneration, true});
    }
    catch (...)
    {
        mpoSpace->Release(oRoom);
        throw;
    }
    Release(oOld.moEntry, oOld.mnGeneration);
}

void StoreWriter::CopyTiles(const StoreFile& oFrom, const std::vector<TakenTile>& oTiles,
                            const std::vector<support::Extent>& oRooms)
{
    const auto Follows = [&](std::size_t nAt)
    {
        const Entry& oLast = oTiles[nAt - 1].moEntry;
        const std::uint64_t nRoom = std::uint64_t{oLast.mnBytes} + oLast.mnBytes % 2;
        return oTiles[nAt].moEntry.mnOffset == oLast.mnOffset + nRoom &&
               oRooms[nAt].mnOffset == oRooms[nAt - 1].mnOffset + nRoom;
    };
    std::vector<unsigned char> oBytes(COPIED_BYTES);
    for (std::size_t nFirst = 0, nEnd = 0; nFirst < oTiles.size(); nFirst = nEnd)
    {
        const std::uint64_t nFrom = oTiles[nFirst].moEntry.mnOffset;
        std::uint64_t nBytes = oTiles[nFirst].moEntry.mnBytes;
        for (nEnd = nFirst + 1; nEnd < oTiles.size() && Follows(nEnd); ++nEnd)
        {
            const std::uint64_t nTogether = oTiles[nEnd].moEntry.mnOffset - nFrom + oTiles[nEnd].moEntry.mnBytes;
            if (nTogether > COPIED_BYTES)
                break;
            nBytes = nTogether;
        }
        std::uint32_t nSum = 0; // of a tile that comes in several pieces
        for (std::uint64_t nAt = 0; nAt < nBytes; nAt += COPIED_BYTES)
        {
            const auto nPart = static_cast<std::size_t>(std::min<std::uint64_t>(COPIED_BYTES, nBytes - nAt));
            oFrom.GetFile().Read(nFrom + nAt, oBytes.data(), nPart);
            for (std::size_t nTile = nFirst; nTile < nEnd; ++nTile)
            {
                const Entry& oEntry = oTiles[nTile].moEntry;
                const std::size_t nOwn = nEnd - nFirst == 1 ? nPart : oEntry.mnBytes;
                nSum = codec::Checksum(nEnd - nFirst == 1 ? nSum : 0, &oBytes[oEntry.mnOffset - nFrom], nOwn);
                if (nAt + nPart == nBytes && nSum != oEntry.mnChecksum)
                    oFrom.Fail(oTiles[nTile].moWhat + ": is damaged: its checksum is wrong");
            }
            GetFile()->Write(oRooms[nFirst].mnOffset + nAt, oBytes.data(), nPart);
        }
        mpoStore->SetEnd(std::max(mpoStore->GetEnd(), oRooms[nFirst].mnOffset + nBytes));
        mnWritten += nBytes;
    }
}

void StoreWriter::TakeTiles(const StoreFile& oFrom, const std::vector<TakenTile>& oTiles)
{
    CheckWritable();
    std::vector<TileTable::Tile> oOld;
    std::vector<support::Extent> oRooms;
    try
    {
        for (const TakenTile& oTile : oTiles)
        {
            const TileTable::Tile* const pOld = oTile.mpTable->Find(*mpoStore, oTile.mnTile);
            oOld.push_back(pOld == nullptr ? TileTable::Tile() : *pOld);
            oRooms.push_back(mpoSpace->Allocate(oTile.moEntry.mnBytes));
        }
        CopyTiles(oFrom, oTiles, oRooms);
    }
    catch (...)
    {
        for (const support::Extent& oRoom : oRooms)
            mpoSpace->Release(oRoom);
        throw;
    }
    for (std::size_t nAt = 0; nAt < oTiles.size(); ++nAt)
    {
        const Entry& oEntry = oTiles[nAt].moEntry;
        const support::Extent& oRoom = oRooms[nAt];
        oTiles[nAt].mpTable->Set(*mpoStore, oTiles[nAt].mnTile,
                                 {{oRoom.mnOffset, oEntry.mnBytes, oEntry.mnChecksum}, oRoom.mnGeneration, true});
        Release(oOld[nAt].moEntry, oOld[nAt].mnGeneration);
    }
}

void StoreWriter::DropTile(TileTable& oTable, std::uint64_t nTile)
{
    CheckWritable();
    const TileTable::Tile* const pOld = oTable.Find(*mpoStore, nTile);
    if (pOld == nullptr)
        return;
    const TileTable::Tile oOld = *pOld;
    oTable.Set(*mpoStore, nTile, {});
    Release(oOld.moEntry, oOld.mnGeneration);
}

void StoreWriter::DropTable(TileTable& oTable)
{
    oTable.ForEach(*mpoStore, true, [](TileTable::Tile&, std::uint64_t) {}); // all can be read, or nothing is given up
    oTable.ForEach(*mpoStore, true,
                   [this](TileTable::Tile& oTile, std::uint64_t) { Release(oTile.moEntry, oTile.mnGeneration); });
    Touch();
}

void StoreWriter::DropPlane(Plane& oPlane)
{
    for (const auto& [nLevel, poTable] : oPlane.moTables)
        DropTable(*poTable);
    oPlane.mbGone = true;
}

void StoreWriter::DropBlob(Blob& oBlob)
{
    Release(oBlob.moEntry, oBlob.mnGeneration);
    oBlob = {};
    Touch();
}

void StoreWriter::Register(const std::shared_ptr<ITileHolder>& poHolder)
{
    std::erase_if(moHolders, [](const std::weak_ptr<ITileHolder>& poOther) { return poOther.expired(); });
    moHolders.push_back(poHolder);
}

void StoreWriter::StoreHeld()
{
    for (const std::weak_ptr<ITileHolder>& poWeak : moHolders)
        if (const std::shared_ptr<ITileHolder> poHolder = poWeak.lock())
            poHolder->StoreHeld();
}

bool StoreWriter::HoldsChanges() const
{
    bool bChanged = mbChanged;
    for (const std::weak_ptr<ITileHolder>& poWeak : moHolders)
        if (const std::shared_ptr<ITileHolder> poHolder = poWeak.lock())
            bChanged = bChanged || poHolder->Holds();
    ForEachTable([&bChanged](TileTable& oTable) { bChanged = bChanged || oTable.IsChanged(); });
    return bChanged;
}

void StoreWriter::Store()
{
    StoreHeld();
    if (HoldsChanges())
        Commit();
}

void StoreWriter::WriteBlob(Blob& oBlob)
{
    if (!oBlob.mbChanged)
        return;
    if (oBlob.moBytes.empty())
        Release(std::exchange(oBlob.moEntry, {}), oBlob.mnGeneration);
    else
        Replace(oBlob.moEntry, oBlob.mnGeneration, oBlob.moBytes);
    oBlob.moBytes = {};
    oBlob.mbChanged = false;
}

void StoreWriter::WriteRecords()
{
    ForEachTable([this](TileTable& oTable) { oTable.WritePages(*this); });
    for (auto& [nNumber, oSegment] : moCatalogue.moSegments)
        WriteBlob(oSegment.moBytes);
    WriteBlob(moCatalogue.moRecord);
    const std::vector<unsigned char> oBytes = moCatalogue.Write();
    if (oBytes.size() > Catalogue::LARGEST_DIRECTORY)
        throw DataException(GetFileName() + ": the directory would be of " + std::to_string(oBytes.size()) +
                            " bytes, more than " + std::to_string(Catalogue::LARGEST_DIRECTORY));
    Replace(moDirectory, mnDirectoryGeneration, oBytes);
}

void StoreWriter::Commit()
{
    mbChanged = true; // until all of it is done
    WriteRecords();
    Root oRoot;
    oRoot.mnGeneration = mnNextGeneration;
    oRoot.mnFileBytes = std::min(mpoSpace->FindUsedEnd(), GetFile()->GetSize());
    oRoot.moDirectory = moDirectory;
    GetFile()->Flush(GetWatch());
    Publish(oRoot);
    // Nobody reads what has no name yet.
    mpoSpace->Reuse(IsNamed() ? GetFile()->FindHeld() : support::Space::Roots(std::in_place));
    mbChanged = false;
    mbOften = true;
}

// What was written is on the disk before the one root that makes it the file's, and that before anything of the former
// state is given up. Nobody knows what is on the disk of a root that may not have reached it: the next one goes
// into the same slot under another number, so that the last good one stays.
void StoreWriter::Publish(const Root& oRoot)
{
    mnCommittedSize = GetFile()->GetSize();
    mpoSpace->Age(oRoot.mnGeneration);
    mnNextGeneration = oRoot.mnGeneration + 2;
    const std::vector<unsigned char> oBytes = oRoot.Make();
    GetFile()->Write(oRoot.GetSlot(), oBytes.data(), oBytes.size());
    GetFile()->Flush();
    mnNextGeneration = oRoot.mnGeneration + 1;
    mpoStore->SetRoot(oRoot);
}

// What lies behind the end that the file could have goes into free room before it; pages of the index that lie there
// are written anew, since a tile of theirs counts as changed.
void StoreWriter::MoveTiles(std::uint64_t nIdealEnd, std::uint64_t nMost)
{
    struct Piece
    {
        TileTable::Tile moTile;
        TileTable* mpTable;
        std::uint64_t mnTile;
    };
    std::vector<Piece> oPieces;
    ForEachTable(
        [&](TileTable& oTable)
        {
            bool bPage = false;
            const auto Look = [&](TileTable::Tile& oTile, std::uint64_t nTile)
            {
                const bool bBehind = oTile.moEntry.mnOffset + oTile.moEntry.mnBytes > nIdealEnd;
                if (nTile == UINT64_MAX)
                    bPage = bPage || bBehind;
                else if (bBehind)
                    oPieces.push_back({oTile, &oTable, nTile});
                else if (std::exchange(bPage, false))
                    oTable.Set(*mpoStore, nTile, TileTable::Tile(oTile));
            };
            oTable.ForEach(*mpoStore, true, Look);
        });
    std::sort(oPieces.begin(), oPieces.end(),
              [](const Piece& oFirst, const Piece& oSecond)
              { return oFirst.moTile.moEntry.mnOffset > oSecond.moTile.moEntry.mnOffset; });
    std::vector<unsigned char> oBytes;
    for (const Piece& oPiece : oPieces)
    {
        const Entry& oOld = oPiece.moTile.moEntry;
        const auto oRoom = mpoSpace->AllocateBefore(oOld.mnBytes, oOld.mnOffset);
        if (!oRoom)
            continue;
        oBytes.resize(oOld.mnBytes);
        GetFile()->Read(oOld.mnOffset, oBytes.data(), oBytes.size());
        GetFile()->Write(oRoom->mnOffset, oBytes.data(), oBytes.size());
        oPiece.mpTable->Set(*mpoStore, oPiece.mnTile,
                            {{oRoom->mnOffset, oOld.mnBytes, oOld.mnChecksum}, oRoom->mnGeneration, false});
        Release(oOld, oPiece.moTile.mnGeneration);
        if (oOld.mnBytes >= nMost)
            break;
        nMost -= oOld.mnBytes;
    }
}

void StoreWriter::RenewRecords(std::uint64_t nIdealEnd)
{
    const auto Renew = [&](Blob& oBlob)
    {
        if (oBlob.moEntry.mnOffset >= nIdealEnd)
            oBlob.Set(oBlob.Get(*mpoStore, "a record"));
    };
    Renew(moCatalogue.moRecord);
    if (moDirectory.mnOffset >= nIdealEnd)
        Touch(); // it is written anew with each state
    for (auto& [nNumber, oSegment] : moCatalogue.moSegments)
        Renew(oSegment.moBytes);
}

void StoreWriter::Compact()
{
    const std::uint64_t nMost = std::max(mnWritten, LITTLE_BYTES);
    for (int nTime = 0; nTime < COMPACTIONS; ++nTime)
    {
        const std::uint64_t nEnd = mpoSpace->FindUsedEnd(), nFree = mpoSpace->CountFree(nEnd);
        if (nFree <= nEnd / KEPT_ROOM_PART)
            break;
        MoveTiles(nEnd - nFree, nMost);
        RenewRecords(nEnd - nFree);
        if (!HoldsChanges())
            break;
        mnBound = nEnd - nFree;
        Commit();
    }
    GetFile()->CutBack(std::max(mpoSpace->CutEnd(), mpoStore->GetRoot().mnFileBytes));
}

void StoreWriter::Finish()
{
    Synchronize();
    SetWatch({}); // what was written is the file's
    if (HasFile())
        Compact();
    End();
}

} // namespace krv::plugins::krvdsk
