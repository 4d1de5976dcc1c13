#include "plugins/support/image/blockcache.h"

#include <algorithm>
#include <iterator>

namespace krv::plugins::support
{

std::size_t BlockCache::KeyHash::operator()(const Key& oKey) const
{
    std::uint64_t nHash = reinterpret_cast<std::uintptr_t>(oKey.mpImage) >> 4;
    nHash = (nHash ^ oKey.mnPlane) * 0x9E3779B97F4A7C15ull;
    nHash = (nHash ^ (nHash >> 29) ^ oKey.mnBlock) * 0xBF58476D1CE4E5B9ull;
    nHash ^= (std::uint64_t{oKey.mnFirstRow} << 32 | oKey.mnRows) * 0x94D049BB133111EBull;
    return static_cast<std::size_t>(nHash ^ (nHash >> 32));
}

void BlockCache::Reserve(std::uint64_t nBytes)
{
    const auto nWanted = static_cast<std::size_t>(std::min<std::uint64_t>(nBytes, MAXIMUM_BOUND));
    mnBound = std::max(mnBound, nWanted);
}

unsigned char* BlockCache::Find(const Key& oKey)
{
    const auto oFound = moIndex.find(oKey);
    if (oFound == moIndex.end())
        return nullptr;
    moEntries.splice(moEntries.begin(), moEntries, oFound->second);
    return oFound->second->mpoBlock.get();
}

std::unique_ptr<unsigned char[]> BlockCache::MakeRoom(std::size_t nBytes)
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

unsigned char* BlockCache::Add(const Key& oKey, std::size_t nBytes)
{
    Drop(oKey);
    std::unique_ptr<unsigned char[]> poBlock = MakeRoom(nBytes);
    if (!poBlock)
        poBlock = std::make_unique_for_overwrite<unsigned char[]>(nBytes);
    moEntries.push_front({oKey, nBytes, std::move(poBlock)});
    moIndex[oKey] = moEntries.begin();
    mnBytes += nBytes;
    return moEntries.front().mpoBlock.get();
}

void BlockCache::Drop(const Key& oKey)
{
    const auto oFound = moIndex.find(oKey);
    if (oFound == moIndex.end())
        return;
    const auto oEntry = oFound->second;
    mnBytes -= oEntry->mnBytes;
    moIndex.erase(oFound);
    moEntries.erase(oEntry);
}

void BlockCache::DropImage(const void* pImage)
{
    for (auto oEntry = moEntries.begin(); oEntry != moEntries.end();)
    {
        const auto oNext = std::next(oEntry);
        if (oEntry->moKey.mpImage == pImage)
            Drop(oEntry->moKey);
        oEntry = oNext;
    }
}

void BlockCache::Clear()
{
    moIndex.clear();
    moEntries.clear();
    mnBytes = 0;
}

} // namespace krv::plugins::support
