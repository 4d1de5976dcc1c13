#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>

namespace krv::cache::detail
{

// The budget and what counts into it. Constant initialisation; every operation is one or a few on atomic numbers.
class Ledger
{
public:
    constexpr Ledger() = default;
    // Without the process's raster buffers.
    explicit Ledger(std::uint64_t nBudget) : mnBudget(nBudget), mbRasters(false) {}
    Ledger(const Ledger&) = delete;
    Ledger& operator=(const Ledger&) = delete;

    // The process's.
    static Ledger& Process();

    std::uint64_t GetBudget() const noexcept;
    void SetBudget(std::uint64_t nBytes) noexcept { mnBudget.store(nBytes); }
    std::uint64_t GetBytes() const noexcept { return mnBytes.load(std::memory_order_relaxed); }
    std::uint64_t GetPeak() const noexcept { return mnPeak.load(std::memory_order_relaxed); }
    void ResetPeak() noexcept { mnPeak.store(GetBytes(), std::memory_order_relaxed); }

    // What tiles may take: raster buffers that wait for their next use have up to an eighth of the budget before them.
    std::uint64_t GetLimit() const noexcept;
    bool IsOver() const noexcept { return GetBytes() > GetLimit(); }
    // Counts nBytes, unless there would be more than the limit then.
    bool TryAdd(std::uint64_t nBytes) noexcept;
    void Add(std::uint64_t nBytes) noexcept;
    void Remove(std::uint64_t nBytes) noexcept { mnBytes.fetch_sub(nBytes, std::memory_order_relaxed); }

    // The most that HMalloc may keep; what it would have kept besides, had there been room.
    std::size_t GetMostKept() const noexcept;
    void NoteRefused(std::size_t nBytes) noexcept;
    // Has HMalloc give back what it keeps above its share.
    void TrimRasters() noexcept;

private:
    void NotePeak(std::uint64_t nBytes) noexcept;

    mutable std::atomic<std::uint64_t> mnBudget{0}; // 0: not known yet
    std::atomic<std::uint64_t> mnBytes{0};
    std::atomic<std::uint64_t> mnPeak{0};
    std::atomic<std::uint64_t> mnRefused{0};
    bool mbRasters = true;
};

} // namespace krv::cache::detail
