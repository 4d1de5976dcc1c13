#include "toolkit/cache/detail/ledger.h"

#include "toolkit/cache/tilestore.h"
#include "toolkit/core/hmalloc.h"

#include <algorithm>

namespace krv::cache::detail
{

namespace
{

constinit Ledger goProcess;

} // namespace

Ledger& Ledger::Process()
{
    return goProcess;
}

// A budget of 0 is kept as 1, which allows as little.
std::uint64_t Ledger::GetBudget() const noexcept
{
    std::uint64_t nBudget = mnBudget.load(std::memory_order_relaxed);
    if (nBudget == 0 && mnBudget.compare_exchange_strong(nBudget, TileStore::GetDefaultBudget()))
        nBudget = mnBudget.load();
    return nBudget;
}

std::uint64_t Ledger::GetLimit() const noexcept
{
    const std::uint64_t nBudget = GetBudget();
    if (!mbRasters)
        return nBudget;
    const std::uint64_t nKept = std::max<std::uint64_t>(HKeptBytes(), mnRefused.load(std::memory_order_relaxed));
    return nBudget - std::min(nKept, nBudget / 8);
}

bool Ledger::TryAdd(std::uint64_t nBytes) noexcept
{
    const std::uint64_t nLimit = GetLimit();
    std::uint64_t nNow = mnBytes.load(std::memory_order_relaxed);
    do
    {
        if (nBytes > nLimit || nNow > nLimit - nBytes)
            return false;
    } while (!mnBytes.compare_exchange_weak(nNow, nNow + nBytes, std::memory_order_relaxed));
    NotePeak(nNow + nBytes);
    return true;
}

void Ledger::Add(std::uint64_t nBytes) noexcept
{
    NotePeak(mnBytes.fetch_add(nBytes, std::memory_order_relaxed) + nBytes);
}

void Ledger::NotePeak(std::uint64_t nBytes) noexcept
{
    std::uint64_t nPeak = mnPeak.load(std::memory_order_relaxed);
    while (nPeak < nBytes && !mnPeak.compare_exchange_weak(nPeak, nBytes, std::memory_order_relaxed))
    {
    }
}

std::size_t Ledger::GetMostKept() const noexcept
{
    const std::uint64_t nBudget = GetBudget();
    const std::uint64_t nBytes = GetBytes();
    return static_cast<std::size_t>(std::min(nBudget / 2, nBudget - std::min(nBytes, nBudget)));
}

// There is room for as many from the next tile on.
void Ledger::NoteRefused(std::size_t nBytes) noexcept
{
    const std::uint64_t nWanted = std::min<std::uint64_t>(HKeptBytes() + nBytes, GetBudget() / 8);
    if (mnRefused.load(std::memory_order_relaxed) < nWanted)
        mnRefused.store(nWanted, std::memory_order_relaxed);
}

void Ledger::TrimRasters() noexcept
{
    if (mbRasters && HKeptBytes() > GetBudget() / 8)
        HTrim();
}

} // namespace krv::cache::detail
