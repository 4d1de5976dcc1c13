#include "toolkit/core/detail/systemblock.h"

#include <sys/mman.h>

#include <cstdint>
#include <cstdlib>

namespace krv::core::detail
{

namespace
{

constexpr std::size_t ALIGNMENT = 64;
constexpr std::size_t LARGE_PAGE = std::size_t(2) << 20;
constexpr std::size_t SMALLEST_MAPPED = std::size_t(4) << 20;

std::size_t RoundUp(std::size_t nBytes, std::size_t nUnit)
{
    return (nBytes + nUnit - 1) / nUnit * nUnit;
}

// A mapping that begins on a large page: one page more is asked for, and what is too much at the ends is given back.
void* MapAligned(std::size_t nBytes) noexcept
{
    const std::size_t nMapped = nBytes + LARGE_PAGE;
    void* pMapping = mmap(nullptr, nMapped, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (pMapping == MAP_FAILED)
        return nullptr;
    auto* pFirst = static_cast<unsigned char*>(pMapping);
    const auto nAddress = reinterpret_cast<std::uintptr_t>(pFirst);
    const std::size_t nBefore = RoundUp(nAddress, LARGE_PAGE) - nAddress;
    if (nBefore != 0)
        munmap(pFirst, nBefore);
    munmap(pFirst + nBefore + nBytes, LARGE_PAGE - nBefore);
    return pFirst + nBefore;
}

// The heap takes the room of a freed block for another of the same size only when it is not asked for an alignment of
// its own: passes through many tiles would make it grow. The byte before the block says how far behind the heap's own
// pointer it lies.
void* NewHeapBlock(std::size_t nBytes) noexcept
{
    auto* const pHeap = static_cast<unsigned char*>(std::malloc(nBytes + ALIGNMENT));
    if (pHeap == nullptr)
        return nullptr;
    const std::size_t nSkipped = ALIGNMENT - reinterpret_cast<std::uintptr_t>(pHeap) % ALIGNMENT;
    pHeap[nSkipped - 1] = static_cast<unsigned char>(nSkipped);
    return pHeap + nSkipped;
}

} // namespace

void* NewSystemBlock(std::size_t nBytes, std::size_t nUsed) noexcept
{
    if (nBytes > SIZE_MAX / 2)
        return nullptr;
    if (nBytes >= SMALLEST_MAPPED)
    {
        void* pBlock = MapAligned(RoundUp(nBytes, LARGE_PAGE));
        if (pBlock != nullptr)
            madvise(pBlock, nUsed / LARGE_PAGE * LARGE_PAGE, MADV_HUGEPAGE);
        return pBlock;
    }
    return NewHeapBlock(nBytes);
}

void DeleteSystemBlock(void* pBlock, std::size_t nBytes) noexcept
{
    auto* const pBytes = static_cast<unsigned char*>(pBlock);
    if (nBytes >= SMALLEST_MAPPED)
        munmap(pBlock, RoundUp(nBytes, LARGE_PAGE));
    else if (pBytes != nullptr)
        std::free(pBytes - pBytes[-1]);
}

} // namespace krv::core::detail
