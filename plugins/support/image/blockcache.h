#pragma once

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>
#include <unordered_map>

namespace krv::plugins::support
{

// Decoded blocks of an open dataset, those used last, bounded in bytes. The memory of a block that has to go serves the
// next one. One thread at a time.
class BlockCache
{
public:
    static constexpr std::size_t MINIMUM_BOUND = std::size_t{64} << 20;
    static constexpr std::size_t MAXIMUM_BOUND = std::size_t{256} << 20;

    struct Key
    {
        const void* mpImage;
        unsigned int mnPlane;
        std::uint64_t mnBlock;
        // For a part of a block: its rows.
        unsigned int mnFirstRow = 0;
        unsigned int mnRows = 0;

        friend bool operator==(const Key&, const Key&) = default;
    };

    explicit BlockCache(std::size_t nBound = MINIMUM_BOUND) : mnBound(nBound) {}

    // Raises the bound to nBytes, never above MAXIMUM_BOUND and never down.
    void Reserve(std::uint64_t nBytes);
    std::size_t GetBound() const { return mnBound; }
    std::size_t GetBytes() const { return mnBytes; }

    // The block's memory, or null; it becomes the one used last.
    unsigned char* Find(const Key& oKey);

    // Memory for a new block, contents undefined; the blocks unused for longest make room. A block above the bound is
    // alone in the cache. The caller fills it, or calls Drop when that fails.
    unsigned char* Add(const Key& oKey, std::size_t nBytes);

    void Drop(const Key& oKey);
    void DropImage(const void* pImage);
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

    std::size_t mnBound;
    std::size_t mnBytes = 0;
    std::list<Entry> moEntries; // the one used last first
    std::unordered_map<Key, std::list<Entry>::iterator, KeyHash> moIndex;
};

} // namespace krv::plugins::support
