#include "toolkit/cache/detail/store.h"

#include <algorithm>
#include <bitset>
#include <new>
#include <utility>

namespace krv::cache::detail
{

namespace
{

// Stamps of what goes only when nothing else does come after all others.
constexpr std::uint64_t LATER = std::uint64_t{1} << 62;

// Tiles that the thread is making, by their layer.
thread_local std::array<unsigned int, 2> taMaking{};

unsigned int& CountMaking(TileLayer eLayer)
{
    return taMaking[static_cast<std::size_t>(eLayer)];
}

// Who makes a tile of some layer waits for lower ones only.
bool MayWait(TileLayer eLayer)
{
    return CountMaking(TileLayer::eBlocks) == 0 &&
           (eLayer == TileLayer::eBlocks || CountMaking(TileLayer::eDerived) == 0);
}

// Memory passes on to tiles that are somewhat smaller, as those at an image's edge: new memory for each of them would
// leave holes behind that nothing fits into.
bool Serves(std::size_t nThere, std::size_t nWanted)
{
    return nThere >= nWanted && nThere / 2 <= nWanted;
}

void Widen(TileFrame& oFrame, const TileFrame& oOther)
{
    oFrame.mnLeft = std::max(oFrame.mnLeft, oOther.mnLeft);
    oFrame.mnTop = std::max(oFrame.mnTop, oOther.mnTop);
    oFrame.mnRight = std::max(oFrame.mnRight, oOther.mnRight);
    oFrame.mnBottom = std::max(oFrame.mnBottom, oOther.mnBottom);
}

} // namespace

Store::Store(Ledger& oLedger) : moLedger(oLedger) {}

Store::Store(std::uint64_t nBudget)
    : mpoOwnLedger(std::make_unique<Ledger>(std::max<std::uint64_t>(1, nBudget))), moLedger(*mpoOwnLedger)
{
}

TileStatistics Store::GetStatistics()
{
    TileStatistics oStatistics;
    for (Shard& oShard : moShards)
    {
        const std::lock_guard oLock(oShard.moMutex);
        oStatistics.mnHits += oShard.mnHits;
        oStatistics.mnMisses += oShard.mnMisses;
        oStatistics.mnWaits += oShard.mnWaits;
        oStatistics.mnEvictions += oShard.mnEvictions;
        oStatistics.mnTiles += oShard.moIndex.size();
    }
    oStatistics.mnBytes = moLedger.GetBytes();
    oStatistics.mnPeak = moLedger.GetPeak();
    return oStatistics;
}

void Store::ResetStatistics()
{
    for (Shard& oShard : moShards)
    {
        const std::lock_guard oLock(oShard.moMutex);
        oShard.mnHits = oShard.mnMisses = oShard.mnWaits = oShard.mnEvictions = 0;
    }
    moLedger.ResetPeak();
}

void Store::Clear()
{
    RemoveIf([](const Entry& oEntry) { return oEntry.mnReferences.load(std::memory_order_acquire) == 1; });
}

std::shared_ptr<OwnerState> Store::AddOwner(TileLayer eLayer)
{
    const auto poOwner = std::make_shared<OwnerState>();
    poOwner->meLayer = eLayer;
    poOwner->mnNumber = mnOwners.fetch_add(1, std::memory_order_relaxed);
    return poOwner;
}

std::shared_ptr<OwnerState> Store::AddOwner(const std::string& identity, TileLayer eLayer)
{
    const std::lock_guard oLock(moMutex);
    auto& [poOwner, nSharing] = moOwners[identity];
    if (!poOwner)
    {
        poOwner = AddOwner(eLayer);
        poOwner->mbShared = true;
        poOwner->moIdentity = identity;
    }
    ++nSharing;
    return poOwner;
}

// An owner of the same identity that comes later has another number.
void Store::RemoveOwner(const std::shared_ptr<OwnerState>& poOwner)
{
    if (poOwner->mbShared)
    {
        const std::lock_guard oLock(moMutex);
        const auto oFound = moOwners.find(poOwner->moIdentity);
        if (--oFound->second.second != 0)
            return;
        moOwners.erase(oFound);
    }
    DropAll(poOwner);
}

void Store::DropAll(const std::shared_ptr<OwnerState>& poOwner)
{
    if (poOwner->mnTiles.load(std::memory_order_relaxed) != 0)
        RemoveIf([&poOwner](const Entry& oEntry) { return oEntry.mpoOwner == poOwner; });
}

void Store::Drop(const OwnerState& oOwner, const TileName& oName)
{
    const TileKey oKey{oOwner.mnNumber, oName};
    Shard& oShard = GetShard(oKey);
    std::unique_ptr<Entry> poGone; // after the lock
    const std::lock_guard oLock(oShard.moMutex);
    Entry* const poEntry = oShard.Find(oKey);
    if (poEntry != nullptr && Remove(oShard, *poEntry))
        poGone.reset(poEntry);
}

void Store::Retire(const OwnerState& oOwner, const TileName& oName, const TileFrame& oFrame)
{
    const TileKey oKey{oOwner.mnNumber, oName};
    Shard& oShard = GetShard(oKey);
    const std::lock_guard oLock(oShard.moMutex);
    Entry* const poEntry = oShard.Find(oKey);
    if (poEntry == nullptr || poEntry->meState != Entry::eReady)
        return;
    if (!poEntry->mbReduced)
        poEntry->moFrame = oFrame;
    else if (oFrame != TileFrame())
        return;
    oShard.Unlist(*poEntry);
    oShard.List(*poEntry, Entry::RETIRED);
}

// Returns whether nobody refers to the entry any more: it is to be deleted, after the lock.
bool Store::Remove(Shard& oShard, Entry& oEntry)
{
    if (oEntry.mbReduced)
        mnFrames.fetch_sub(oEntry.moMemory.GetSize(), std::memory_order_relaxed);
    return oShard.Remove(oEntry);
}

template <typename Test>
void Store::RemoveIf(const Test& oTest)
{
    for (Shard& oShard : moShards)
    {
        Entry* poGone = nullptr;
        {
            const std::lock_guard oLock(oShard.moMutex);
            for (auto oAt = oShard.moIndex.begin(); oAt != oShard.moIndex.end();)
            {
                Entry* const poEntry = (oAt++)->second;
                if (oTest(*poEntry) && Remove(oShard, *poEntry))
                    poEntry->mpoNewer = std::exchange(poGone, poEntry);
            }
        }
        while (poGone != nullptr)
            delete std::exchange(poGone, poGone->mpoNewer);
    }
}

void Store::Touch(Shard& oShard, Entry& oEntry, const TileFrame& oFrame)
{
    if (!oEntry.mbReduced)
        Widen(oEntry.moFrame, oFrame);
    oShard.Unlist(oEntry);
    oShard.List(oEntry, Now());
}

// Waits until the entry is made; the lock is free meanwhile. Null when the maker has it for himself.
Entry* Store::Await(Entry& oEntry, Shard& oShard, std::unique_lock<std::mutex>& oLock)
{
    oEntry.mnReferences.fetch_add(1, std::memory_order_relaxed);
    ++oShard.mnWaits;
    oShard.moDone.wait(oLock, [&oEntry] { return oEntry.meState != Entry::eComing; });
    if (oEntry.meState == Entry::eReady)
        return &oEntry;
    const std::exception_ptr oFailure = oEntry.moFailure;
    oLock.unlock();
    Release(&oEntry);
    if (oFailure)
        std::rethrow_exception(oFailure);
    oLock.lock();
    return nullptr;
}

Store::Result Store::Search(const std::shared_ptr<OwnerState>& poOwner, const TileRequest& oRequest, bool bClaim,
                            bool bWait)
{
    const TileKey oKey{poOwner->mnNumber, oRequest.moName};
    Shard& oShard = GetShard(oKey);
    std::unique_ptr<Entry> poGone; // after the lock
    std::unique_lock oLock(oShard.moMutex);
    bool bAlone = false;
    for (Entry* poEntry = oShard.Find(oKey); poEntry != nullptr && !bAlone; poEntry = oShard.Find(oKey))
    {
        const bool bSame = poEntry->moShape == oRequest.moShape;
        const bool bComing = poEntry->meState == Entry::eComing;
        if (bSame && bComing && bWait && MayWait(poOwner->meLayer))
        {
            if (Entry* const poMade = Await(*poEntry, oShard, oLock))
                return {poMade, nullptr};
        }
        else if (bSame && !bComing && poEntry->Holds(oRequest.moArea))
        {
            ++oShard.mnHits;
            Touch(oShard, *poEntry, oRequest.moFrame);
            poEntry->mnReferences.fetch_add(1, std::memory_order_relaxed);
            return {poEntry, nullptr};
        }
        else if (!bClaim || (bSame && bComing && !bWait))
            return {};
        else if (bSame && bComing)
            bAlone = true;
        else if (Remove(oShard, *poEntry))
            poGone.reset(poEntry);
    }
    if (!bClaim)
        return {};
    auto poNew = std::make_unique<Entry>();
    poNew->moName = oRequest.moName;
    poNew->moShape = oRequest.moShape;
    poNew->moFrame = oRequest.moFrame;
    poNew->mpoOwner = poOwner;
    if (!bAlone)
        oShard.Insert(oKey, *poNew);
    ++oShard.mnMisses;
    oLock.unlock();
    mnClock.fetch_add(1, std::memory_order_relaxed);
    ++CountMaking(poOwner->meLayer);
    try
    {
        GiveMemory(*poNew);
    }
    catch (...)
    {
        Finish(*poNew, Entry::eFailed, std::current_exception());
        Release(poNew.release());
        throw;
    }
    return {nullptr, poNew.release()};
}

void Store::Finish(Entry& oEntry, Entry::State eState, std::exception_ptr oFailure) noexcept
{
    --CountMaking(oEntry.mpoOwner->meLayer);
    Shard& oShard = GetShard({oEntry.mpoOwner->mnNumber, oEntry.moName});
    {
        const std::lock_guard oLock(oShard.moMutex);
        if (oEntry.mbIndexed && eState != Entry::eReady)
            static_cast<void>(Remove(oShard, oEntry)); // the maker refers to it still
        oEntry.meState = eState;
        oEntry.moFailure = std::move(oFailure);
        if (oEntry.mbIndexed)
            oShard.List(oEntry, Memory::Cost(oEntry.GetBytes()) > moLedger.GetLimit() ? Entry::RETIRED : Now());
    }
    oShard.moDone.notify_all();
}

void Store::Release(Entry* poEntry) noexcept
{
    const unsigned int nReferences = poEntry->mnReferences.fetch_sub(1, std::memory_order_acq_rel);
    if (nReferences == 1)
        delete poEntry;
    else if (nReferences == 2 && moLedger.IsOver())
        Settle();
}

void Store::GiveMemory(Entry& oEntry)
{
    const std::size_t nBytes = oEntry.GetBytes();
    const std::uint64_t nCost = Memory::Cost(nBytes);
    bool bCounted = moLedger.TryAdd(nCost);
    // A tile above the limit passes through; others do not go for its sake.
    while (!bCounted && nCost <= moLedger.GetLimit())
    {
        moLedger.TrimRasters();
        if (!EvictOne(&oEntry))
            break;
        if (oEntry.moMemory.Get() != nullptr)
            return Settle();
        bCounted = moLedger.TryAdd(nCost);
    }
    if (!bCounted)
        moLedger.Add(nCost);
    oEntry.moMemory = Memory(moLedger, nBytes);
}

void Store::Settle()
{
    while (moLedger.IsOver() && EvictOne(nullptr))
    {
    }
}

// The shards tell their oldest without a lock: what they said may have changed, and then the next one is asked. Frames
// stay until nothing else is left or they take half of the room. poTaker gets the memory if it is of a size that
// serves.
bool Store::EvictOne(Entry* poTaker)
{
    std::bitset<2 * SHARDS> oTried;
    for (;;)
    {
        const bool bFrames = mnFrames.load(std::memory_order_relaxed) > moLedger.GetLimit() / 2;
        std::uint64_t nBest = Shard::NOTHING;
        std::size_t nAt = 0;
        for (std::size_t nList = 0; nList < 2 * SHARDS; ++nList)
        {
            std::uint64_t nStamp = moShards[nList / 2].moOldest[nList % 2].load(std::memory_order_relaxed);
            if (nStamp == Shard::NOTHING || oTried[nList])
                continue;
            if (nStamp != Entry::RETIRED && (nList % 2 == Shard::eReduced) != bFrames)
                nStamp += LATER;
            if (nStamp < nBest)
            {
                nBest = nStamp;
                nAt = nList;
            }
        }
        if (nBest == Shard::NOTHING)
            return false;
        if (EvictFrom(moShards[nAt / 2], nAt % 2, poTaker))
            return true;
        oTried[nAt] = true;
    }
}

bool Store::EvictFrom(Shard& oShard, std::size_t nList, Entry* poTaker)
{
    std::unique_ptr<Entry> poGone; // after the lock, as the memory
    Memory oFreed;
    const std::lock_guard oLock(oShard.moMutex);
    Entry* poEntry = oShard.moLists[nList].GetOldest();
    while (poEntry != nullptr && poEntry->mnReferences.load(std::memory_order_acquire) != 1)
        poEntry = poEntry->mpoNewer;
    if (poEntry == nullptr)
        return false;
    ++oShard.mnEvictions;
    if (!Reduce(oShard, *poEntry, oFreed))
    {
        if (Remove(oShard, *poEntry))
            poGone.reset(poEntry);
        oFreed = std::move(poEntry->moMemory);
    }
    if (poTaker != nullptr && Serves(oFreed.GetSize(), poTaker->GetBytes()))
        poTaker->moMemory = std::move(oFreed);
    return true;
}

// False when there is no frame to be kept, or no memory even for that.
bool Store::Reduce(Shard& oShard, Entry& oEntry, Memory& oFreed)
{
    if (oEntry.mbReduced || !oEntry.HasFrame())
        return false;
    const std::size_t nBytes = oEntry.GetFrameBytes();
    moLedger.Add(Memory::Cost(nBytes));
    Memory oFrame;
    try
    {
        oFrame = Memory(moLedger, nBytes);
    }
    catch (const std::bad_alloc&)
    {
        return false;
    }
    oShard.Unlist(oEntry);
    oFreed = oEntry.Reduce(std::move(oFrame));
    oShard.List(oEntry, Now());
    mnFrames.fetch_add(nBytes, std::memory_order_relaxed);
    return true;
}

} // namespace krv::cache::detail
