#include "toolkit/cache/detail/shard.h"

namespace krv::cache::detail
{

Entry* Shard::Find(const TileKey& oKey) const
{
    const auto oFound = moIndex.find(oKey);
    return oFound == moIndex.end() ? nullptr : oFound->second;
}

void Shard::Insert(const TileKey& oKey, Entry& oEntry)
{
    moIndex[oKey] = &oEntry;
    oEntry.mbIndexed = true;
    oEntry.mnReferences.fetch_add(1, std::memory_order_relaxed);
    oEntry.mpoOwner->mnTiles.fetch_add(1, std::memory_order_relaxed);
}

bool Shard::Remove(Entry& oEntry)
{
    if (oEntry.meState == Entry::eReady)
        Unlist(oEntry);
    moIndex.erase({oEntry.mpoOwner->mnNumber, oEntry.moName});
    oEntry.mbIndexed = false;
    oEntry.mpoOwner->mnTiles.fetch_sub(1, std::memory_order_relaxed);
    return oEntry.mnReferences.fetch_sub(1, std::memory_order_acq_rel) == 1;
}

void Shard::List(Entry& oEntry, std::uint64_t nStamp)
{
    const std::size_t nList = oEntry.mbReduced ? eReduced : eWhole;
    oEntry.mnStamp = nStamp;
    if (nStamp == Entry::RETIRED)
        moLists[nList].AddOldest(oEntry);
    else
        moLists[nList].AddNewest(oEntry);
    NoteOldest(nList);
}

void Shard::Unlist(Entry& oEntry)
{
    const std::size_t nList = oEntry.mbReduced ? eReduced : eWhole;
    moLists[nList].Remove(oEntry);
    NoteOldest(nList);
}

void Shard::NoteOldest(std::size_t nList)
{
    const Entry* const poOldest = moLists[nList].GetOldest();
    moOldest[nList].store(poOldest == nullptr ? NOTHING : poOldest->mnStamp, std::memory_order_relaxed);
}

} // namespace krv::cache::detail
