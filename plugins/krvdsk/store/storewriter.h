#pragma once

#include "plugins/krvdsk/store/catalogue.h"
#include "plugins/krvdsk/store/storefile.h"
#include "plugins/support/file/space.h"
#include "plugins/support/writing/filewriter.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::krvdsk
{

// Whoever holds pixels back that are still to be stored.
class ITileHolder
{
public:
    virtual ~ITileHolder();
    virtual bool Holds() const = 0;
    virtual void StoreHeld() = 0;
};

// A native file that is written. Tiles, pages of their index and records only ever go where no state that anybody may
// read has anything; Synchronize writes what changed of the index and the directory, makes sure that all of it is on
// the disk, and then makes it the file's by writing the other root. One thread at a time.
class StoreWriter : public support::FileWriter
{
public:
    // A new file, which LayOut makes. oDefaults: how it is stored.
    StoreWriter(const std::string& fileName, const Catalogue& oDefaults);
    // An existing one, open for update. Throws FileFormatException for a file that cannot be updated.
    explicit StoreWriter(std::shared_ptr<support::File> poFile);
    ~StoreWriter() override;

    // What the file is to hold; whoever changes it calls Touch. Pixels and records change by the calls below.
    Catalogue& GetCatalogue() { return moCatalogue; }
    const std::shared_ptr<StoreFile>& GetStore() const { return mpoStore; }
    void Touch() { mbChanged = true; }

    // Makes a new file of the image that the catalogue describes.
    void LayOut();
    // Back to before LayOut.
    void Restart() noexcept;

    // Puts bytes in the place of what an entry names. nGeneration: of its room.
    void Replace(Entry& oEntry, std::uint64_t& nGeneration, const std::vector<unsigned char>& oBytes);
    void WriteTile(TileTable& oTable, std::uint64_t nTile, const unsigned char* pBytes, std::size_t nBytes);
    // Tiles of another file as they are stored there, with their checksums, which are compared on the way: all of them,
    // or none when it throws. Those side by side go together.
    struct TakenTile
    {
        TileTable* mpTable; // of this file
        std::uint64_t mnTile;
        Entry moEntry; // in the other file, where it may lie
        std::string moWhat;
    };
    void TakeTiles(const StoreFile& oFrom, const std::vector<TakenTile>& oTiles);
    // The tile becomes one that is not stored.
    void DropTile(TileTable& oTable, std::uint64_t nTile);
    void DropTable(TileTable& oTable);
    void DropPlane(Plane& oPlane);
    void DropBlob(Blob& oBlob);

    // Are asked to store what they hold back by Synchronize.
    void Register(const std::shared_ptr<ITileHolder>& poHolder);
    void StoreHeld();

    std::uint64_t CountUnused() const { return mpoSpace->CountUnused(); }

    // Moves what lies at the end of the file into room that is free, as far as that pays, and gives the rest back.
    void Finish() override;
    void Discard() noexcept override;

protected:
    void Store() override;
    bool HoldsChanges() const override;

private:
    void UseSpace(std::uint64_t nEnd);
    void FindUsed();
    void BeginFlush(const support::Extent& oPiece);
    support::Extent WritePiece(const void* pBytes, std::size_t nBytes);
    void CopyTiles(const StoreFile& oFrom, const std::vector<TakenTile>& oTiles,
                   const std::vector<support::Extent>& oRooms);
    void Release(const Entry& oEntry, std::uint64_t nGeneration);
    void WriteBlob(Blob& oBlob);
    void WriteRecords();
    void Commit();
    void Publish(const Root& oRoot);
    void ForEachTable(const std::function<void(TileTable& oTable)>& oAction) const;
    void Compact();
    void MoveTiles(std::uint64_t nIdealEnd, std::uint64_t nMost);
    void RenewRecords(std::uint64_t nIdealEnd);

    Catalogue moCatalogue;
    std::shared_ptr<StoreFile> mpoStore;
    std::unique_ptr<support::Space> mpoSpace;
    std::vector<std::weak_ptr<ITileHolder>> moHolders;
    Entry moDirectory;
    std::uint64_t mnDirectoryGeneration = 0;
    std::uint64_t mnNextGeneration = 1; // of the file
    std::uint64_t mnCommittedSize = 0;  // of the file with all that its committed state may use
    std::uint64_t mnWritten = 0;        // bytes, since the file was opened
    std::uint64_t mnBound = 0;          // pieces go before it or soon after; 0: anywhere
    support::Extent moUnflushed;        // written side by side since the last BeginFlush
    bool mbOften = false;               // the file was brought to the disk before its end
    bool mbChanged = false;
};

} // namespace krv::plugins::krvdsk
