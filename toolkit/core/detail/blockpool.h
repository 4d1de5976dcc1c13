#pragma once

#include "toolkit/api.h"

#include <array>
#include <atomic>
#include <cstddef>

namespace krv::core::detail
{

// The store behind HMalloc. Large blocks that are freed wait in slots, sorted by size class, for the next request of
// about their size. Every step is one atomic operation on a slot or a counter: a thread never waits for another, it
// looks at the next slot, or goes to the system. Constant initialisation, nothing happens at exit.
class KRV_TOOLKIT_API BlockPool
{
public:
    static constexpr std::size_t ALIGNMENT = 64;
    // Smaller blocks are never kept: the system's allocator is as good.
    static constexpr std::size_t SMALLEST_KEPT = std::size_t(32) << 10;
    // More bytes than this are never kept, nor more than were live at once (in blocks of SMALLEST_KEPT and above).
    static constexpr std::size_t MOST_KEPT = std::size_t(512) << 20;

    constexpr BlockPool() = default;
    BlockPool(const BlockPool&) = delete;
    BlockPool& operator=(const BlockPool&) = delete;

    // Throws std::bad_alloc.
    void* Allocate(std::size_t nBytes);
    // A block of this pool, or null. Keeps it unless more than nMost bytes were kept then; returns the bytes that it
    // would have kept were it not for nMost.
    std::size_t Free(void* pBlock, std::size_t nMost = MOST_KEPT) noexcept;

    // Gives back all that is kept; the peak starts anew from what is live.
    void Trim() noexcept;

    std::size_t GetKeptBytes() const noexcept { return mnKept.load(std::memory_order_relaxed); }
    std::size_t GetPeakBytes() const noexcept { return mnPeak.load(std::memory_order_relaxed); }

    // Size classes are an eighth of a power of two apart. The class whose blocks hold nBytes, and what they hold.
    static std::size_t ClassOf(std::size_t nBytes);
    static std::size_t ClassBytes(std::size_t nClass);

private:
    struct Block;

    static constexpr std::size_t STEPS = 8; // classes per doubling
    static constexpr std::size_t CLASSES = 14 * STEPS + 1;
    static constexpr std::size_t SLOTS = 64;
    static constexpr std::size_t NO_CLASS = ~std::size_t(0);

    struct SizeClass
    {
        std::array<std::atomic<Block*>, SLOTS> moSlots{};
        std::atomic<int> mnCount{0};       // about how many slots are taken
        std::atomic<bool> mbWanted{false}; // a block was taken out since the last search for room
    };

    Block* Take(SizeClass& oClass) noexcept;
    bool Put(SizeClass& oClass, Block* poBlock) noexcept;
    Block* TakeFor(std::size_t nBytes) noexcept;
    Block* MakeFor(std::size_t nBytes);
    bool Reserve(std::size_t nBytes, std::size_t nMost) noexcept;
    bool MakeRoom(std::size_t nBytes, std::size_t nMost) noexcept;
    bool Keep(Block* poBlock, std::size_t nMost) noexcept;
    void NoteLive(std::size_t nBytes) noexcept;

    std::array<SizeClass, CLASSES> moClasses{};
    std::atomic<std::size_t> mnKept{0};
    std::atomic<std::size_t> mnLive{0};
    std::atomic<std::size_t> mnPeak{0};
    std::atomic<std::size_t> mnNextVictim{0};
};

} // namespace krv::core::detail
