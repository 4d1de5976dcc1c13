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
    // What it may hold without being asked, and at most, in bytes.
    static constexpr std::size_t LEAST_BOUND = std::size_t{64} << 10;
    static constexpr std::size_t MOST_BOUND = std::size_t{64} << 20;

    // A plain value: which block of which plane, all of it or some rows.
    struct Key
    {
        unsigned int mnPlane;  // from 0
        std::uint64_t mnBlock; // ImageLayout::GetBlockIndex
        // For a part of a block: its rows.
        unsigned int mnFirstRow = 0; // counted from the block's first
        unsigned int mnRows = 0;     // 0: all of the block

        friend bool operator==(const Key&, const Key&) = default;
    };

    // Raises the bound to nBytes, never above MOST_BOUND and an eighth of the process's budget, and never down.
    // For a row of blocks that the windows of a pass go along.
    void Reserve(std::uint64_t nBytes);

    // In bytes.
    std::size_t GetBound() const { return mnBound; }

    // The block's memory, or null; it becomes the one used last.
    unsigned char* Find(const Key& oKey);

    // Memory for a new block, contents undefined; the blocks unused for longest make room. A block above the bound is
    // alone in the cache. The caller fills it, or calls Drop when that fails.
    unsigned char* Add(const Key& oKey, std::size_t nBytes);

    // A block that is not there is no error.
    void Drop(const Key& oKey);

    // Gives all memory back.
    void Clear();

private:
    struct KeyHash
    {
        std::size_t operator()(const Key& oKey) const;
    };

    struct Entry
    {
        Key moKey;
        std::size_t mnBytes; // of the block
        std::unique_ptr<unsigned char[]> mpoBlock;
    };

    std::unique_ptr<unsigned char[]> MakeRoom(std::size_t nBytes);

    std::size_t mnBound = LEAST_BOUND; // bytes that may be held
    std::size_t mnBytes = 0;           // bytes that are held
    krv::cache::TileCharge moCharge;   // of those bytes, in the process's budget
    std::list<Entry> moEntries;        // the one used last first
    std::unordered_map<Key, std::list<Entry>::iterator, KeyHash> moIndex;
};

} // namespace krv::plugins::support
