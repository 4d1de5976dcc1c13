#pragma once

#include "toolkit/cache/tilestore.h"

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>
#include <unordered_map>

namespace krv::plugins::support
{

// The few blocks, or rows of blocks, of one image of which parts are read, that neighbouring windows share: so few that
// they stay in the processor's own caches, where the process's store would bring in new memory for each. The memory of
// a block that has to go serves the next one; it counts into the budget of the store. One thread at a time.
class RowCache
{
public:
    static constexpr std::size_t LEAST_BOUND = std::size_t{64} << 10;
    static constexpr std::size_t MOST_BOUND = std::size_t{64} << 20;

    struct Key
    {
        unsigned int mnPlane;
        std::uint64_t mnBlock;
        // For a part of a block: its rows.
        unsigned int mnFirstRow = 0;
        unsigned int mnRows = 0;

        friend bool operator==(const Key&, const Key&) = default;
    };

    // Raises the bound to nBytes, never above MOST_BOUND and an eighth of the process's budget, and never down.
    void Reserve(std::uint64_t nBytes);
    std::size_t GetBound() const { return mnBound; }

    // The block's memory, or null; it becomes the one used last.
    unsigned char* Find(const Key& oKey);

    // Memory for a new block, contents undefined; the blocks unused for longest make room. A block above the bound is
    // alone in the cache. The caller fills it, or calls Drop when that fails.
    unsigned char* Add(const Key& oKey, std::size_t nBytes);

    void Drop(const Key& oKey);
    void Clear();

private:
    struct KeyHash
    {
        std::size_t operator()(const Key& oKey) const;
    };

    struct Entry
    {
        Key moKey;
        std::size_t mnBytes;
        std::unique_ptr<unsigned char[]> mpoBlock;
    };

    std::unique_ptr<unsigned char[]> MakeRoom(std::size_t nBytes);

    std::size_t mnBound = LEAST_BOUND;
    std::size_t mnBytes = 0;
    krv::cache::TileCharge moCharge;
    std::list<Entry> moEntries; // the one used last first
    std::unordered_map<Key, std::list<Entry>::iterator, KeyHash> moIndex;
};

} // namespace krv::plugins::support
