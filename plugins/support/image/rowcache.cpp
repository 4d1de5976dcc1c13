#include "plugins/support/image/rowcache.h"

#include <algorithm>

namespace krv::plugins::support
{

std::size_t RowCache::KeyHash::operator()(const Key& oKey) const
{
    std::uint64_t nHash = oKey.mnPlane * 0x9E3779B97F4A7C15ull;
    nHash = (nHash ^ (nHash >> 29) ^ oKey.mnBlock) * 0xBF58476D1CE4E5B9ull;
    nHash ^= (std::uint64_t{oKey.mnFirstRow} << 32 | oKey.mnRows) * 0x94D049BB133111EBull;
    return static_cast<std::size_t>(nHash ^ (nHash >> 32));
}

void RowCache::Reserve(std::uint64_t nBytes)
{
    if (nBytes <= mnBound)
        return;
    const std::uint64_t nShare = krv::cache::TileStore::Process().GetBudget() / 8;
    mnBound = std::max(mnBound, static_cast<std::size_t>(std::min({nBytes, nShare, std::uint64_t{MOST_BOUND}})));
}

unsigned char* RowCache::Find(const Key& oKey)
{
    const auto oFound = moIndex.find(oKey);
    if (oFound == moIndex.end())
        return nullptr;
    moEntries.splice(moEntries.begin(), moEntries, oFound->second);
    return oFound->second->mpoBlock.get();
}

std::unique_ptr<unsigned char[]> RowCache::MakeRoom(std::size_t nBytes)
{
    std::unique_ptr<unsigned char[]> poBlock;
    while (!moEntries.empty() && (nBytes > mnBound || mnBytes > mnBound - nBytes))
    {
        Entry& oOldest = moEntries.back();
        poBlock.reset();
        if (oOldest.mnBytes == nBytes)
            poBlock = std::move(oOldest.mpoBlock);
        mnBytes -= oOldest.mnBytes;
        moIndex.erase(oOldest.moKey);
        moEntries.pop_back();
    }
    return poBlock;
}

unsigned char* RowCache::Add(const Key& oKey, std::size_t nBytes)
{
    Drop(oKey);
    std::unique_ptr<unsigned char[]> poBlock = MakeRoom(nBytes);
    if (!poBlock)
        poBlock = std::make_unique_for_overwrite<unsigned char[]>(nBytes);
    moEntries.push_front({oKey, nBytes, std::move(poBlock)});
    moIndex[oKey] = moEntries.begin();
    mnBytes += nBytes;
    moCharge.Set(mnBytes);
    return moEntries.front().mpoBlock.get();
}

void RowCache::Drop(const Key& oKey)
{
    const auto oFound = moIndex.find(oKey);
    if (oFound == moIndex.end())
        return;
    const auto oEntry = oFound->second;
    mnBytes -= oEntry->mnBytes;
    moIndex.erase(oFound);
    moEntries.erase(oEntry);
}

void RowCache::Clear()
{
    moIndex.clear();
    moEntries.clear();
    mnBytes = 0;
    moCharge.Set(0);
}

} // namespace krv::plugins::support
