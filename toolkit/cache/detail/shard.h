#pragma once

#include "toolkit/cache/detail/entry.h"

#include <array>
#include <condition_variable>
#include <mutex>
#include <unordered_map>

namespace krv::cache::detail
{

// Where a tile stands in the index: the number of its owner, and its name.
struct TileKey
{
    std::uint64_t mnOwner;
    TileName moName;

    friend bool operator==(const TileKey&, const TileKey&) = default;

    std::uint64_t Hash() const
    {
        std::uint64_t nHash = (mnOwner ^ std::uint64_t{moName.mnLayer} << 40) * 0x9E3779B97F4A7C15ull;
        nHash = (nHash ^ (nHash >> 29) ^ moName.mnTile) * 0xBF58476D1CE4E5B9ull;
        nHash = (nHash ^ (nHash >> 32)) * 0x94D049BB133111EBull;
        return nHash ^ (nHash >> 29);
    }
};

struct TileKeyHash
{
    // The lowest bits choose the shard.
    std::size_t operator()(const TileKey& oKey) const { return static_cast<std::size_t>(oKey.Hash() >> 8); }
};

// A part of the index with the entries in it. The mutex guards all but the numbers that are atomic, and of the entries
// what entry.h says; it is held for a look-up, a change of the lists or the copy of a frame, never while a tile is made
// and never together with that of another shard.
struct alignas(64) Shard
{
    enum List
    {
        eWhole,
        eReduced
    };

    static constexpr std::uint64_t NOTHING = UINT64_MAX;

    std::mutex moMutex;
    std::unordered_map<TileKey, Entry*, TileKeyHash> moIndex;
    std::array<UseList, 2> moLists; // of what is ready
    std::uint64_t mnHits = 0;
    std::uint64_t mnMisses = 0;
    std::uint64_t mnWaits = 0;
    std::uint64_t mnEvictions = 0;
    std::condition_variable moDone;
    // The stamps at the old ends of the lists, for whoever looks for the oldest entry of all.
    std::array<std::atomic<std::uint64_t>, 2> moOldest{NOTHING, NOTHING};

    Entry* Find(const TileKey& oKey) const;
    void Insert(const TileKey& oKey, Entry& oEntry);
    // Takes an entry out of the index and the lists. Returns whether that was the last reference.
    [[nodiscard]] bool Remove(Entry& oEntry);
    // Into its list, as the newest, or with the stamp RETIRED as the oldest.
    void List(Entry& oEntry, std::uint64_t nStamp);
    void Unlist(Entry& oEntry);

private:
    void NoteOldest(std::size_t nList);
};

} // namespace krv::cache::detail
