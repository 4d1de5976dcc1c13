#pragma once

#include "toolkit/cache/detail/shard.h"

#include <memory>
#include <string>
#include <unordered_map>
#include <utility>

namespace krv::cache::detail
{

// What is behind TileStore and its owners, holds and claims.
class Store
{
public:
    explicit Store(Ledger& oLedger);
    explicit Store(std::uint64_t nBudget);
    Store(const Store&) = delete;
    Store& operator=(const Store&) = delete;

    Ledger& GetLedger() { return moLedger; }
    TileStatistics GetStatistics();
    void ResetStatistics();
    void Clear();

    std::shared_ptr<OwnerState> AddOwner(TileLayer eLayer);
    std::shared_ptr<OwnerState> AddOwner(const std::string& identity, TileLayer eLayer);
    void RemoveOwner(const std::shared_ptr<OwnerState>& poOwner);
    void DropAll(const std::shared_ptr<OwnerState>& poOwner);
    void Drop(const OwnerState& oOwner, const TileName& oName);
    void Retire(const OwnerState& oOwner, const TileName& oName, const TileFrame& oFrame);

    // A tile or a part that is found comes with one reference in poTile; a tile that the caller is to make with one in
    // poMake, and with its memory.
    struct Result
    {
        Entry* mpoTile = nullptr;
        Entry* mpoMake = nullptr;
    };
    Result Search(const std::shared_ptr<OwnerState>& poOwner, const TileRequest& oRequest, bool bClaim, bool bWait);
    // Ends what Search gave to be made: what failed or is for its maker alone leaves the index.
    void Finish(Entry& oEntry, Entry::State eState, std::exception_ptr oFailure) noexcept;
    void Release(Entry* poEntry) noexcept;
    // Makes room until the bytes are within the budget, as far as nobody holds them.
    void Settle();

private:
    // So many that eight threads seldom want the same.
    static constexpr std::size_t SHARDS = 64;

    Shard& GetShard(const TileKey& oKey) { return moShards[oKey.Hash() % SHARDS]; }
    std::uint64_t Now() const { return mnClock.load(std::memory_order_relaxed); }
    [[nodiscard]] bool Remove(Shard& oShard, Entry& oEntry);
    template <typename Test>
    void RemoveIf(const Test& oTest);
    void Touch(Shard& oShard, Entry& oEntry, const TileFrame& oFrame);
    Entry* Await(Entry& oEntry, Shard& oShard, std::unique_lock<std::mutex>& oLock);
    void GiveMemory(Entry& oEntry);
    bool EvictOne(Entry* poTaker);
    bool EvictFrom(Shard& oShard, std::size_t nList, Entry* poTaker);
    bool Reduce(Shard& oShard, Entry& oEntry, Memory& oFreed);

    std::unique_ptr<Ledger> mpoOwnLedger;
    Ledger& moLedger;
    std::array<Shard, SHARDS> moShards;
    alignas(64) std::atomic<std::uint64_t> mnClock{Entry::RETIRED + 1}; // counts tiles to be made
    std::atomic<std::uint64_t> mnFrames{0};                             // bytes of entries that are reduced
    std::atomic<std::uint64_t> mnOwners{0};

    // Guards the owners with an identity, and how many share each of them.
    std::mutex moMutex;
    std::unordered_map<std::string, std::pair<std::shared_ptr<OwnerState>, std::size_t>> moOwners;
};

} // namespace krv::cache::detail
