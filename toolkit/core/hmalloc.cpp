#include "toolkit/core/hmalloc.h"

#include "toolkit/cache/detail/ledger.h"
#include "toolkit/core/detail/blockpool.h"

#include <cstdlib>
#include <new>

#ifdef KRV_SANITIZED

void* HMalloc(std::size_t nBytes)
{
    void* pBlock = nullptr;
    if (posix_memalign(&pBlock, krv::core::detail::BlockPool::ALIGNMENT, nBytes != 0 ? nBytes : 1) != 0)
        throw std::bad_alloc();
    return pBlock;
}

void HFree(void* pBlock) noexcept
{
    std::free(pBlock);
}

void HTrim() noexcept {}

std::size_t HKeptBytes() noexcept
{
    return 0;
}

#else

namespace
{

constinit krv::core::detail::BlockPool goPool;

} // namespace

void* HMalloc(std::size_t nBytes)
{
    return goPool.Allocate(nBytes);
}

void HFree(void* pBlock) noexcept
{
    krv::cache::detail::Ledger& oLedger = krv::cache::detail::Ledger::Process();
    if (const std::size_t nRefused = goPool.Free(pBlock, oLedger.GetMostKept()); nRefused != 0)
        oLedger.NoteRefused(nRefused);
}

void HTrim() noexcept
{
    goPool.Trim();
}

std::size_t HKeptBytes() noexcept
{
    return goPool.GetKeptBytes();
}

#endif
