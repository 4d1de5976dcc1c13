#include "toolkit/core/detail/blockpool.h"
#include "toolkit/core/hblock.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <random>
#include <thread>
#include <vector>

using krv::HBlock;
using krv::core::detail::BlockPool;

namespace
{

constexpr std::size_t KIB = 1024;
constexpr std::size_t MIB = 1024 * KIB;

bool IsAligned(const void* pBlock)
{
    return reinterpret_cast<std::uintptr_t>(pBlock) % 64 == 0;
}

// A pool of its own for a test; gives back what it keeps.
struct TestPool
{
    std::unique_ptr<BlockPool> moPool = std::make_unique<BlockPool>();

    ~TestPool() { moPool->Trim(); }
    BlockPool* operator->() { return moPool.get(); }

    // Allocates all, touches both ends, frees all.
    void Cycle(const std::vector<std::size_t>& oSizes)
    {
        std::vector<void*> oBlocks;
        for (std::size_t nBytes : oSizes)
        {
            oBlocks.push_back(moPool->Allocate(nBytes));
            std::memset(oBlocks.back(), 1, 1);
            std::memset(static_cast<char*>(oBlocks.back()) + nBytes - 1, 2, 1);
        }
        for (void* pBlock : oBlocks)
            moPool->Free(pBlock);
    }
};

} // namespace

TEST(HMallocTest, BlocksOfAnySizeAreAlignedAndUsable)
{
    for (std::size_t nBytes : {std::size_t(0), std::size_t(1), 63 * KIB + 7, 192 * KIB, 5 * MIB + 3, 40 * MIB})
    {
        const HBlock oBlock(static_cast<unsigned char*>(HMalloc(nBytes)));
        ASSERT_TRUE(IsAligned(oBlock.get())) << nBytes;
        std::memset(oBlock.get(), 0x5A, nBytes);
    }
    HFree(nullptr);
    HTrim();
    EXPECT_EQ(HKeptBytes(), 0u);
#ifndef KRV_SANITIZED // sanitizers stop at such a request by themselves
    for (std::size_t nBytes : {SIZE_MAX, SIZE_MAX - 64, SIZE_MAX / 2, SIZE_MAX / 4 - 100})
        EXPECT_THROW(HMalloc(nBytes), std::bad_alloc);
#endif
}

TEST(BlockPoolTest, ClassesHoldTheirSizesWithLittleWaste)
{
    for (std::size_t nBytes = BlockPool::SMALLEST_KEPT; nBytes <= BlockPool::MOST_KEPT; nBytes += 1 + nBytes / 97)
    {
        const std::size_t nClass = BlockPool::ClassOf(nBytes);
        ASSERT_GE(BlockPool::ClassBytes(nClass), nBytes);
        ASSERT_LE(BlockPool::ClassBytes(nClass), nBytes + nBytes / 8);
        ASSERT_EQ(BlockPool::ClassOf(BlockPool::ClassBytes(nClass)), nClass);
    }
    EXPECT_EQ(BlockPool::ClassBytes(BlockPool::ClassOf(192 * KIB)), 192 * KIB);
    EXPECT_EQ(BlockPool::ClassBytes(BlockPool::ClassOf(BlockPool::MOST_KEPT)), BlockPool::MOST_KEPT);
}

TEST(BlockPoolTest, ReusesBlocksForTheSameAndForSmallerSizes)
{
    TestPool oPool;
    for (std::size_t nBytes : {192 * KIB, 48 * MIB})
    {
        std::vector<void*> oFirst;
        for (int i = 0; i < 8; ++i)
            oFirst.push_back(oPool->Allocate(nBytes));
        for (void* pBlock : oFirst)
            oPool->Free(pBlock);
        EXPECT_EQ(oPool->GetKeptBytes(), 8 * nBytes) << "eight freed together are all kept";
        std::vector<void*> oSecond;
        for (int i = 0; i < 8; ++i)
            oSecond.push_back(oPool->Allocate(nBytes - i * nBytes / 16)); // as for tiles cut at an edge
        EXPECT_EQ(oPool->GetKeptBytes(), 0u);
        for (void* pBlock : oSecond)
            oPool->Free(pBlock);
        std::sort(oFirst.begin(), oFirst.end());
        std::sort(oSecond.begin(), oSecond.end());
        EXPECT_EQ(oFirst, oSecond);
        oPool->Trim();
        EXPECT_EQ(oPool->GetKeptBytes(), 0u);
        EXPECT_EQ(oPool->GetPeakBytes(), 0u);
    }
}

TEST(BlockPoolTest, KeepsNoMoreThanThePeakAndTheLimit)
{
    TestPool oPool;
    std::mt19937 oRandom(3);
    std::size_t nMostLive = 0;
    for (int nRound = 0; nRound < 300; ++nRound)
    {
        std::vector<std::size_t> oSizes(1 + oRandom() % 9);
        std::size_t nLive = 0;
        for (std::size_t& nBytes : oSizes)
            nLive += nBytes = 16 * KIB + oRandom() % (3 * MIB);
        oPool.Cycle(oSizes);
        nMostLive = std::max(nMostLive, nLive);
        ASSERT_LE(oPool->GetKeptBytes(), nMostLive);
        ASSERT_LE(oPool->GetPeakBytes(), nMostLive);
    }
    oPool.Cycle(std::vector<std::size_t>(24, 30 * MIB));
    EXPECT_LE(oPool->GetKeptBytes(), BlockPool::MOST_KEPT);
    EXPECT_GT(oPool->GetKeptBytes(), BlockPool::MOST_KEPT - 30 * MIB);
    oPool.Cycle({BlockPool::MOST_KEPT + 1});
    EXPECT_LE(oPool->GetKeptBytes(), BlockPool::MOST_KEPT);
}

// Blocks change hands between threads; nobody ever finds another's mark in his own.
TEST(BlockPoolTest, ThreadsShareThePool)
{
    constexpr int THREADS = 4;
    constexpr int ROUNDS = 4000;
    TestPool oPool;
    std::array<std::atomic<std::size_t*>, 12> oBasket{};
    std::atomic<int> nFaults{0};
    // A block tells its length in its first word and a mark in the second, in the middle and at its end.
    const auto Release = [&](std::size_t* pBlock)
    {
        if (pBlock != nullptr)
            nFaults += pBlock[pBlock[0] / 2] != pBlock[1] || pBlock[pBlock[0] - 1] != pBlock[1];
        oPool->Free(pBlock);
    };
    const auto Work = [&](unsigned int nThread)
    {
        std::mt19937 oRandom(nThread);
        for (int nRound = 0; nRound < ROUNDS; ++nRound)
        {
            const std::size_t nWords = (24 * KIB + oRandom() % (200 * KIB)) / sizeof(std::size_t);
            auto* const pBlock = static_cast<std::size_t*>(oPool->Allocate(nWords * sizeof(std::size_t)));
            pBlock[0] = nWords;
            for (const std::size_t nWord : {std::size_t(1), nWords / 2, nWords - 1})
                pBlock[nWord] = nThread * ROUNDS + static_cast<std::size_t>(nRound);
            Release(oBasket[oRandom() % oBasket.size()].exchange(pBlock));
            if (nRound % 500 == 499)
                oPool->Trim();
        }
    };
    std::vector<std::thread> oThreads;
    for (unsigned int nThread = 0; nThread < THREADS; ++nThread)
        oThreads.emplace_back(Work, nThread);
    for (std::thread& oThread : oThreads)
        oThread.join();
    for (auto& oSlot : oBasket)
        Release(oSlot);
    EXPECT_EQ(nFaults, 0);
    EXPECT_LE(oPool->GetKeptBytes(), oPool->GetPeakBytes());
    oPool->Trim();
    EXPECT_EQ(oPool->GetKeptBytes(), 0u);
    EXPECT_EQ(oPool->GetPeakBytes(), 0u) << "what was freed no longer counts as live";
}
