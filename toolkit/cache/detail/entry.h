#pragma once

#include "toolkit/cache/detail/ledger.h"
#include "toolkit/cache/tilestore.h"

#include <atomic>
#include <exception>
#include <memory>
#include <string>

namespace krv::cache::detail
{

struct OwnerState
{
    std::uint64_t mnNumber = 0;
    TileLayer meLayer = TileLayer::eBlocks;
    bool mbShared = false;
    std::string moIdentity;
    std::atomic<std::uint64_t> mnTiles{0}; // that a look can find
};

// Memory from the system; what it takes counts into a ledger as long as it is there.
class Memory
{
public:
    Memory() = default;
    // Takes over what was counted for it already: Cost(nBytes). Throws std::bad_alloc, and then counts it no more.
    Memory(Ledger& oLedger, std::size_t nBytes);
    Memory(Memory&& oOther) noexcept { *this = std::move(oOther); }
    Memory& operator=(Memory&& oOther) noexcept;
    ~Memory();

    // What a tile of so many bytes counts for: its entry is more than nothing where tiles are small.
    static std::uint64_t Cost(std::size_t nBytes) { return std::uint64_t{nBytes} + 256; }

    unsigned char* Get() const { return mpBytes; }
    std::size_t GetSize() const { return mnBytes; }

private:
    Ledger* mpLedger = nullptr;
    unsigned char* mpBytes = nullptr;
    std::size_t mnBytes = 0;
};

// A tile, or what is left of it. References are the index's, holds', claims' and those of threads that wait; only the
// first allows the entry to change. What is not atomic is guarded by the mutex of the shard, but for the memory: of a
// claim it belongs to whoever has that, afterwards nobody changes it.
struct Entry
{
    enum State
    {
        eComing,
        eReady,
        eWithheld,
        eFailed
    };

    static constexpr std::uint64_t RETIRED = 0;

    TileName moName;
    TileShape moShape;
    TileFrame moFrame;
    std::shared_ptr<OwnerState> mpoOwner;
    std::atomic<unsigned int> mnReferences{1};
    State meState = eComing;
    std::exception_ptr moFailure;
    bool mbIndexed = false;
    bool mbReduced = false; // only the frame is left
    std::uint64_t mnStamp = 0;
    Memory moMemory;
    Entry* mpoOlder = nullptr;
    Entry* mpoNewer = nullptr;

    std::size_t GetBytes() const { return moShape.mnRowBytes * moShape.mnRows; }
    // Where the area begins, and the bytes from row to row; null when the frame has it not.
    const unsigned char* Locate(const TileArea& oArea, std::size_t& nPitch) const;
    bool Holds(const TileArea& oArea) const
    {
        std::size_t nPitch = 0;
        return Locate(oArea, nPitch) != nullptr;
    }
    // Whether keeping the frame pays.
    bool HasFrame() const;
    std::size_t GetFrameBytes() const;
    // Copies the frame, which is all that stays, and gives the memory of the tile away.
    Memory Reduce(Memory oFrame);
};

// Entries by their last use.
class UseList
{
public:
    Entry* GetOldest() const { return mpoOldest; }
    void AddNewest(Entry& oEntry);
    void AddOldest(Entry& oEntry);
    void Remove(Entry& oEntry);

private:
    Entry* mpoOldest = nullptr;
    Entry* mpoNewest = nullptr;
};

} // namespace krv::cache::detail
