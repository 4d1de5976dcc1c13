#pragma once

#include "toolkit/api.h"

#include <cstddef>
#include <cstdint>
#include <exception>
#include <memory>
#include <string>

namespace krv::cache
{

namespace detail
{
struct Entry;
struct OwnerState;
class Store;
} // namespace detail

// A tile is any bytes in rows without gaps.
struct TileShape
{
    std::size_t mnRowBytes = 0; // of one row, without padding
    std::size_t mnRows = 1;

    friend bool operator==(const TileShape&, const TileShape&) = default;
};

// A part of a tile: bytes along each row, and rows.
// Numbers of an area count from the first byte of the tile's first row. An area may be empty.
struct TileArea
{
    std::size_t mnX = 0; // bytes, not pixels
    std::size_t mnY = 0; // rows
    std::size_t mnRowBytes = 0;
    std::size_t mnRows = 0;
};

// The border of a tile: bytes at both ends of every row, rows above and below.
// A frame of zeros: nothing stays. It is what neighbours need as their margin once the tile itself has been read.
struct TileFrame
{
    std::size_t mnLeft = 0;
    std::size_t mnTop = 0;
    std::size_t mnRight = 0;
    std::size_t mnBottom = 0;

    friend bool operator==(const TileFrame&, const TileFrame&) = default;
};

// One of an owner's tiles.
struct TileName
{
    std::uint64_t mnTile = 0;  // what counts tiles is the owner's to choose
    std::uint32_t mnLayer = 0; // tells several tiles of one number apart, such as channels or levels

    friend bool operator==(const TileName&, const TileName&) = default;
};

// What is asked of the store. Whoever uses the same name gives the same shape.
struct TileRequest
{
    TileName moName;
    TileShape moShape;
    TileArea moArea;   // inside the shape
    TileFrame moFrame; // what of the tile stays when all of it has to make room; more than half of it: nothing stays
};

// Numbers of the store since it began, or since ResetStatistics.
struct TileStatistics
{
    std::uint64_t mnHits = 0;      // looks that found the tile, or the part of it that was asked for
    std::uint64_t mnMisses = 0;    // tiles that had to be made
    std::uint64_t mnWaits = 0;     // looks that waited for another thread to make the tile
    std::uint64_t mnEvictions = 0; // tiles that made room, all or all but their frame
    std::uint64_t mnTiles = 0;     // tiles and frames there are now
    std::uint64_t mnBytes = 0;     // what counts into the budget now, without freed raster buffers
    std::uint64_t mnPeak = 0;      // the most of these bytes there were
};

// What tiles are made of. A thread that makes derived ones waits for blocks which others decode.
// The order is that of waiting: eDerived tiles are made of eBlocks ones, never the other way.
enum class TileLayer
{
    eBlocks, // of files
    eDerived // of what readers give
};

class TileClaim;
class TileOwner;

// Decoded tiles of the whole process, the least recently used go first. One budget in bytes holds for all of them, for
// what TileCharge names, and for the raster buffers that HMalloc keeps; it is set by SetBudget and by nothing else.
// Tiles that somebody holds stay, so that the bytes can exceed a budget that is less than what is in use.
// Any number of threads may use it. None waits for another unless both want a tile that one of them is making.
// Example: a viewer that wants 256 MiB for all its files calls
//   krv::cache::TileStore::Process().SetBudget(std::uint64_t{256} << 20);
class KRV_TOOLKIT_API TileStore
{
public:
    // The process's own.
    static TileStore& Process();
    // The smaller of 1 GiB and a quarter of the memory.
    // In bytes. It is the budget of Process() until somebody sets another.
    static std::uint64_t GetDefaultBudget();

    // Another one, with a budget of its own.
    explicit TileStore(std::uint64_t nBudget);
    ~TileStore();
    TileStore(const TileStore&) = delete;
    TileStore& operator=(const TileStore&) = delete;

    // In bytes. What is above it now goes, as far as nobody holds it.
    // 0 keeps nothing but what is held. Readers go on to work then, and decode a block each time they need it.
    void SetBudget(std::uint64_t nBytes);

    // In bytes, as SetBudget or the constructor set it.
    std::uint64_t GetBudget() const;

    // A copy of one moment; other threads may change the numbers at once.
    TileStatistics GetStatistics() const;
    // Counts anew; the peak begins at what there is.
    void ResetStatistics();
    // Drops all tiles that nobody holds.
    // Tiles that are being made stay. A reader is not disturbed: it decodes again what it wants again.
    void Clear();

private:
    friend class TileOwner;
    friend class TileCharge;

    explicit TileStore(std::unique_ptr<detail::Store> poStore);

    std::unique_ptr<detail::Store> mpoStore; // never null
};

// Keeps a tile where it is, and points to the part that was asked for: to be let go soon. Empty when there is none.
class KRV_TOOLKIT_API TileHold
{
public:
    // Moves alone: one hold, one reference. The moved-from one is empty. A hold belongs to one thread at a time.
    TileHold() = default;
    TileHold(TileHold&& oOther) noexcept;
    TileHold& operator=(TileHold&& oOther) noexcept;

    // Lets the tile go, which may then be dropped to make room.
    ~TileHold();

    explicit operator bool() const { return mpFirst != nullptr; }
    // The first byte of the part, and the bytes from each of its rows to the next.
    // Valid as long as the hold lives. Nobody writes to the bytes of a tile that was published.
    const unsigned char* GetFirst() const { return mpFirst; }
    std::size_t GetPitch() const { return mnPitch; }

private:
    friend class TileClaim;
    friend class TileOwner;

    // Takes over one reference.
    TileHold(detail::Store& oStore, detail::Entry* poEntry, const TileArea& oArea);

    detail::Store* mpoStore = nullptr;      // borrowed; null for an empty hold
    detail::Entry* mpoEntry = nullptr;      // with one reference
    const unsigned char* mpFirst = nullptr; // of the part
    std::size_t mnPitch = 0;
};

// The task to make a tile; others that want it wait. It is done on the thread that got it, which may look for other
// tiles meanwhile and then waits only for tiles of a lower layer: of its own or a higher one it gets a claim of its own
// for what another thread is making. So threads never wait in a circle. A claim that goes undone has those who wait
// look again.
class KRV_TOOLKIT_API TileClaim
{
public:
    // An empty claim, which no operation but the conversion to bool may be asked of.
    TileClaim() = default;
    TileClaim(TileClaim&& oOther) noexcept;
    TileClaim& operator=(TileClaim&& oOther) noexcept;

    // A claim that was neither published, withheld nor failed is given up here: those who wait look again.
    ~TileClaim();

    explicit operator bool() const { return mpoEntry != nullptr; }
    // The memory of the tile, 64-byte aligned, contents undefined.
    // Rows lie without padding, mnRowBytes * mnRows bytes of the shape in the request. Only the claim's thread writes
    // them.
    unsigned char* GetBytes() const;

    // The tile is made. oArea: what the caller wants of it.
    // The claim is empty afterwards, and all rows of the tile have been written before.
    TileHold Publish(const TileArea& oArea);
    // The tile is made, but for the caller alone; who waits looks again.
    TileHold Withhold(const TileArea& oArea);
    // It cannot be made: who waits gets the exception, and nothing stays.
    void Fail(const std::exception_ptr& oFailure) noexcept;

private:
    friend class TileOwner;

    TileClaim(detail::Store& oStore, detail::Entry* poEntry);

    // nState: how it went; wakes those who wait.
    void End(int nState, const std::exception_ptr& oFailure) noexcept;

    detail::Store* mpoStore = nullptr; // borrowed; null for an empty claim
    detail::Entry* mpoEntry = nullptr; // being made by this claim's thread
};

// What a look gave: a hold, or a claim, or neither when the tile is being made and the caller did not want to wait.
// Example of the use that Obtain makes of it: when moClaim is set, fill GetBytes() and Publish; else read moHold.
struct TileLook
{
    TileHold moHold;
    TileClaim moClaim;
};

// Somebody's tiles in a store. Owners with the same identity have the same tiles: what one of them made the others
// find. When the last of them goes its tiles go too; claims go before, holds may go after. Any number of
// threads may use one.
class KRV_TOOLKIT_API TileOwner
{
public:
    // Shares with nobody.
    explicit TileOwner(TileStore& oStore = TileStore::Process(), TileLayer eLayer = TileLayer::eBlocks);
    // identity: any bytes that say all of what decides which bytes a tile has. One identity is of one layer.
    explicit TileOwner(const std::string& identity, TileStore& oStore = TileStore::Process(),
                       TileLayer eLayer = TileLayer::eBlocks);
    ~TileOwner();

    // Not copied: another owner of the same tiles is made by the same identity.
    TileOwner(const TileOwner&) = delete;
    TileOwner& operator=(const TileOwner&) = delete;

    enum class Wait
    {
        eYes,
        eNo
    };

    // The part of the tile when it is there, of one that is being made after it is; otherwise empty. Throws what the
    // maker threw.
    // It makes nothing, so that a caller who gets nothing may decode to where the pixels are wanted, without the store.
    TileHold Find(const TileRequest& oRequest, Wait eWait = Wait::eYes) const;
    // The same, with the claim to make a tile that is not there. Throws std::bad_alloc too.
    // Whoever got a claim publishes, withholds or fails it soon: others stand still until then.
    TileLook Look(const TileRequest& oRequest, Wait eWait = Wait::eYes) const;

    // The part of a tile that is made when it is not there. oMake(unsigned char* pBytes) fills all of its rows; what it
    // throws passes, here and in all threads that wait for the tile.
    // Throws std::bad_alloc when there is no memory for the tile, whatever the budget says.
    template <typename Make>
    TileHold Obtain(const TileRequest& oRequest, const Make& oMake) const
    {
        TileLook oLook = Look(oRequest);
        if (!oLook.moClaim)
            return std::move(oLook.moHold);
        try
        {
            oMake(oLook.moClaim.GetBytes());
        }
        catch (...)
        {
            oLook.moClaim.Fail(std::current_exception());
            throw;
        }
        return oLook.moClaim.Publish(oRequest.moArea);
    }

    // The tile is not expected to be wanted again, or no more of it than the frame: of all tiles it goes first.
    // A tile that is not there is no error.
    void Retire(const TileName& oName, const TileFrame& oFrame = {}) const;
    // Forgets a tile, or all of them, those that are being made included.
    // To be called when the bytes of a file change. Holds of dropped tiles stay valid, with the old bytes.
    void Drop(const TileName& oName) const;
    void DropAll() const;
    // Whether there is no tile, not even one that is being made.
    // The answer is of one moment, as other owners of the identity may make tiles meanwhile.
    bool IsEmpty() const;

private:
    detail::Store& moStore;                       // outlives the owner
    std::shared_ptr<detail::OwnerState> mpoState; // shared with owners of the same identity
};

// Bytes that somebody keeps elsewhere and that count into the budget of the store.
// Memory that is charged is never freed by the store: it only takes the place of tiles. The charge ends with the
// object.
class KRV_TOOLKIT_API TileCharge
{
public:
    explicit TileCharge(TileStore& oStore = TileStore::Process());
    ~TileCharge();
    TileCharge(const TileCharge&) = delete;
    TileCharge& operator=(const TileCharge&) = delete;

    // From now on so many; tiles make room for what is more than before.
    // Any thread; the last call counts. 0 takes the charge away.
    void Set(std::size_t nBytes);

private:
    detail::Store& moStore; // outlives the charge
    std::size_t mnBytes = 0;
};

} // namespace krv::cache
