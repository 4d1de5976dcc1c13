#include "toolkit/core/detail/blockpool.h"

#include "toolkit/core/detail/systemblock.h"

#include <algorithm>
#include <bit>
#include <new>

namespace krv::core::detail
{

namespace
{

constexpr std::size_t SMALLEST_SHIFT = 15;

// A block up to four times too large is taken rather than new memory: its pages are there already, as with the narrow
// tiles at an image's edge.
constexpr std::size_t CLASSES_SEARCHED = 17;

// Threads begin their search at different slots, so that each finds again what it freed itself.
std::size_t FirstSlot(std::size_t nSlots)
{
    static std::atomic<std::size_t> nThreads{0};
    static thread_local const std::size_t nThread = nThreads.fetch_add(1, std::memory_order_relaxed);
    return nThread * 8 % nSlots;
}

} // namespace

// Stands in the 64 bytes before the memory that the caller sees.
struct alignas(BlockPool::ALIGNMENT) BlockPool::Block
{
    std::size_t mnSystemBytes; // with this header, as asked of the system
    std::size_t mnClass;
    std::size_t mnRequested; // by the present owner
    std::size_t mnTouched;   // the largest request so far

    void* Memory() { return this + 1; }
    static Block* Of(void* pMemory) { return static_cast<Block*>(pMemory) - 1; }

    static Block* New(std::size_t nCapacity, std::size_t nRequested, std::size_t nClass) noexcept
    {
        if (nCapacity > SIZE_MAX / 4)
            return nullptr;
        const std::size_t nBytes = nCapacity + sizeof(Block);
        void* pMemory = NewSystemBlock(nBytes, nRequested + sizeof(Block));
        return pMemory == nullptr ? nullptr : new (pMemory) Block{nBytes, nClass, nRequested, nRequested};
    }

    static void Delete(Block* poBlock) noexcept { DeleteSystemBlock(poBlock, poBlock->mnSystemBytes); }
};

std::size_t BlockPool::ClassOf(std::size_t nBytes)
{
    if (nBytes <= SMALLEST_KEPT)
        return 0;
    const auto nShift = static_cast<std::size_t>(std::bit_width(nBytes - 1)) - 1;
    const std::size_t nStep = (std::size_t(1) << nShift) / STEPS;
    const std::size_t nAbove = nBytes - (std::size_t(1) << nShift);
    return (nShift - SMALLEST_SHIFT) * STEPS + (nAbove + nStep - 1) / nStep;
}

std::size_t BlockPool::ClassBytes(std::size_t nClass)
{
    return ((STEPS + nClass % STEPS) << (SMALLEST_SHIFT + nClass / STEPS)) / STEPS;
}

void* BlockPool::Allocate(std::size_t nBytes)
{
    Block* poBlock = TakeFor(nBytes);
    if (poBlock == nullptr)
        poBlock = MakeFor(nBytes);
    if (nBytes >= SMALLEST_KEPT)
        NoteLive(nBytes);
    return poBlock->Memory();
}

std::size_t BlockPool::Free(void* pBlock, std::size_t nMost) noexcept
{
    if (pBlock == nullptr)
        return 0;
    Block* poBlock = Block::Of(pBlock);
    if (poBlock->mnRequested >= SMALLEST_KEPT)
        mnLive.fetch_sub(poBlock->mnRequested, std::memory_order_relaxed);
    if (Keep(poBlock, nMost))
        return 0;
    const std::size_t nPeak = std::min(MOST_KEPT, mnPeak.load(std::memory_order_relaxed));
    const std::size_t nBytes = poBlock->mnClass == NO_CLASS ? 0 : poBlock->mnTouched;
    Block::Delete(poBlock);
    return nMost < nPeak && nBytes <= nPeak ? nBytes : 0;
}

void BlockPool::Trim() noexcept
{
    for (SizeClass& oClass : moClasses)
        while (Block* poBlock = Take(oClass))
            Block::Delete(poBlock);
    mnPeak.store(mnLive.load(std::memory_order_relaxed), std::memory_order_relaxed);
}

BlockPool::Block* BlockPool::TakeFor(std::size_t nBytes) noexcept
{
    if (nBytes < SMALLEST_KEPT || nBytes > MOST_KEPT)
        return nullptr;
    const std::size_t nFirst = ClassOf(nBytes);
    const std::size_t nEnd = std::min(nFirst + CLASSES_SEARCHED, CLASSES);
    for (std::size_t nClass = nFirst; nClass < nEnd; ++nClass)
    {
        if (moClasses[nClass].mnCount.load(std::memory_order_relaxed) <= 0)
            continue;
        if (Block* poBlock = Take(moClasses[nClass]))
        {
            // A block that is merely large enough is not wanted for its size: it may give way to those that are.
            if (nClass == nFirst)
                moClasses[nClass].mbWanted.store(true, std::memory_order_relaxed);
            poBlock->mnRequested = nBytes;
            poBlock->mnTouched = std::max(poBlock->mnTouched, nBytes);
            return poBlock;
        }
    }
    return nullptr;
}

BlockPool::Block* BlockPool::MakeFor(std::size_t nBytes)
{
    const bool bPooled = nBytes >= SMALLEST_KEPT && nBytes <= MOST_KEPT;
    const std::size_t nClass = bPooled ? ClassOf(nBytes) : NO_CLASS;
    const std::size_t nCapacity = bPooled ? ClassBytes(nClass) : nBytes;
    Block* poBlock = Block::New(nCapacity, nBytes, nClass);
    if (poBlock == nullptr)
    {
        Trim();
        poBlock = Block::New(nCapacity, nBytes, nClass);
    }
    if (poBlock == nullptr)
        throw std::bad_alloc();
    return poBlock;
}

BlockPool::Block* BlockPool::Take(SizeClass& oClass) noexcept
{
    const std::size_t nFirst = FirstSlot(SLOTS);
    for (std::size_t i = 0; i < SLOTS; ++i)
    {
        std::atomic<Block*>& oSlot = oClass.moSlots[(nFirst + i) % SLOTS];
        if (oSlot.load(std::memory_order_relaxed) == nullptr)
            continue;
        if (Block* poBlock = oSlot.exchange(nullptr, std::memory_order_acquire))
        {
            oClass.mnCount.fetch_sub(1, std::memory_order_relaxed);
            mnKept.fetch_sub(poBlock->mnTouched, std::memory_order_relaxed);
            return poBlock;
        }
    }
    return nullptr;
}

bool BlockPool::Put(SizeClass& oClass, Block* poBlock) noexcept
{
    const std::size_t nFirst = FirstSlot(SLOTS);
    for (std::size_t i = 0; i < SLOTS; ++i)
    {
        std::atomic<Block*>& oSlot = oClass.moSlots[(nFirst + i) % SLOTS];
        Block* poEmpty = nullptr;
        if (oSlot.load(std::memory_order_relaxed) == nullptr &&
            oSlot.compare_exchange_strong(poEmpty, poBlock, std::memory_order_release, std::memory_order_relaxed))
        {
            oClass.mnCount.fetch_add(1, std::memory_order_relaxed);
            return true;
        }
    }
    return false;
}

bool BlockPool::Keep(Block* poBlock, std::size_t nMost) noexcept
{
    if (poBlock->mnClass == NO_CLASS)
        return false;
    const std::size_t nBytes = poBlock->mnTouched;
    if (!Reserve(nBytes, nMost) && !MakeRoom(nBytes, nMost))
        return false;
    if (Put(moClasses[poBlock->mnClass], poBlock))
        return true;
    mnKept.fetch_sub(nBytes, std::memory_order_relaxed);
    return false;
}

bool BlockPool::Reserve(std::size_t nBytes, std::size_t nMost) noexcept
{
    nMost = std::min({nMost, MOST_KEPT, mnPeak.load(std::memory_order_relaxed)});
    std::size_t nKept = mnKept.load(std::memory_order_relaxed);
    do
    {
        if (nBytes > nMost || nKept > nMost - nBytes)
            return false;
    } while (!mnKept.compare_exchange_weak(nKept, nKept + nBytes, std::memory_order_relaxed));
    return true;
}

// Classes that nobody wanted since the last search give up their blocks; the others are spared once.
bool BlockPool::MakeRoom(std::size_t nBytes, std::size_t nMost) noexcept
{
    for (std::size_t i = 0; i < CLASSES; ++i)
    {
        SizeClass& oClass = moClasses[mnNextVictim.fetch_add(1, std::memory_order_relaxed) % CLASSES];
        if (oClass.mnCount.load(std::memory_order_relaxed) <= 0 ||
            oClass.mbWanted.exchange(false, std::memory_order_relaxed))
            continue;
        while (Block* poBlock = Take(oClass))
        {
            Block::Delete(poBlock);
            if (Reserve(nBytes, nMost))
                return true;
        }
    }
    return false;
}

void BlockPool::NoteLive(std::size_t nBytes) noexcept
{
    const std::size_t nLive = mnLive.fetch_add(nBytes, std::memory_order_relaxed) + nBytes;
    std::size_t nPeak = mnPeak.load(std::memory_order_relaxed);
    while (nPeak < nLive && !mnPeak.compare_exchange_weak(nPeak, nLive, std::memory_order_relaxed))
    {
    }
}

} // namespace krv::core::detail
