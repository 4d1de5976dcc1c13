// Tasks on a program's threads: order, failures, ends.
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/threading/foreachitem.h"
#include "toolkit/threading/statestore.h"
#include "toolkit/threading/threadpool.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>
#include <vector>

namespace krv::threading
{

namespace
{

void Rest(std::uint64_t nItem)
{
    std::this_thread::sleep_for(std::chrono::microseconds(nItem * 7919 % 500));
}

// Takes tasks and begins none: all its threads are busy with something else.
class BusyExecutor : public IExecutor
{
public:
    unsigned int GetThreadCount() const override { return 3; }
    void Run(std::function<void()> oTask) override { moTasks.push_back(std::move(oTask)); }
    std::vector<std::function<void()>> moTasks;
};

} // namespace

TEST(TaskGroupThreads, ResultsComeInOrderAndAreBounded)
{
    BusyExecutor oBusy;
    ThreadPool oOne(1), oSeven(7);
    for (IExecutor* const poExecutor : {static_cast<IExecutor*>(nullptr), static_cast<IExecutor*>(&oBusy),
                                        static_cast<IExecutor*>(&oOne), static_cast<IExecutor*>(&oSeven)})
    {
        std::atomic<std::uint64_t> nMade = 0;
        std::vector<std::uint64_t> oTaken;
        {
            TaskGroup oGroup(poExecutor);
            ForEachItem(
                oGroup, 200,
                [&](std::uint64_t nItem)
                {
                    Rest(nItem);
                    ++nMade;
                    return nItem;
                },
                [&](std::uint64_t nItem)
                {
                    EXPECT_LE(nMade - oTaken.size(), oGroup.GetAhead());
                    oTaken.push_back(nItem);
                });
        }
        ASSERT_EQ(oTaken.size(), 200u);
        EXPECT_TRUE(std::is_sorted(oTaken.begin(), oTaken.end()));
    }
    // They come when the group is gone, and find nothing to do.
    for (const auto& oTask : oBusy.moTasks)
        oTask();
}

TEST(TaskGroupThreads, AnyOrderTakesEachOnce)
{
    ThreadPool oThreads(3);
    TaskGroup oGroup(&oThreads);
    std::vector<int> oTaken(300, 0);
    ForEachItem(
        oGroup, 300,
        [](std::uint64_t nItem)
        {
            Rest(nItem);
            return nItem;
        },
        [&](std::uint64_t nItem) { ++oTaken[nItem]; }, TaskOrder::eAsDone);
    EXPECT_EQ(oTaken, std::vector<int>(300, 1));
}

// The failure of the first item in order is told, although a later one fails at once; nothing runs afterwards.
TEST(TaskGroupThreads, TheFirstFailureInOrderIsTold)
{
    for (const unsigned int nThreads : {0U, 1U, 2U, 7U})
    {
        ThreadPool oThreads(nThreads);
        std::atomic<int> nRunning = 0;
        unsigned int nTaken = 0;
        TaskGroup oGroup(&oThreads);
        try
        {
            ForEachItem(
                oGroup, 100,
                [&](std::uint64_t nItem)
                {
                    ++nRunning;
                    if (nItem == 20)
                        std::this_thread::sleep_for(std::chrono::milliseconds(5));
                    --nRunning;
                    if (nItem >= 20)
                        throw DataException("item " + std::to_string(nItem));
                    return nItem;
                },
                [&](std::uint64_t) { ++nTaken; });
            FAIL();
        }
        catch (const DataException& oError)
        {
            EXPECT_EQ(oError.GetMessage(), "item 20");
            EXPECT_EQ(nTaken, 20u);
            EXPECT_EQ(nRunning, 0);
        }
    }
}

TEST(TaskGroupThreads, IdleEndsTheWaiting)
{
    struct Stop
    {
    };
    ThreadPool oThreads(1);
    std::atomic<bool> bBegun = false, bEnd = false;
    const auto oStart = std::chrono::steady_clock::now();
    {
        TaskGroup oGroup(&oThreads,
                         [&]
                         {
                             bEnd = true; // what runs is waited for
                             throw Stop();
                         });
        TaskLine oLine(oGroup);
        oLine.Add(
            [&]
            {
                bBegun = true;
                while (!bEnd)
                    std::this_thread::sleep_for(std::chrono::milliseconds(1));
            },
            {});
        while (!bBegun)
            std::this_thread::yield();
        EXPECT_THROW(oLine.TakeNext(), Stop);
    }
    EXPECT_LT(std::chrono::steady_clock::now() - oStart, std::chrono::seconds(5));
}

TEST(TaskGroupThreads, StatesAreNeverShared)
{
    struct State
    {
        std::atomic<bool> mbUsed = false;
    };
    for (const int nMost : {0, 2})
    {
        std::atomic<int> nMade = 0;
        StateStore<State> oStates([&]() -> std::unique_ptr<State>
                                  { return ++nMade <= nMost ? std::make_unique<State>() : nullptr; });
        oStates.Add(std::make_unique<State>());
        ThreadPool oThreads(4);
        TaskGroup oGroup(&oThreads);
        int nTaken = 0;
        ForEachItem(
            oGroup, 200,
            [&](std::uint64_t nItem)
            {
                const StateStore<State>::Use oState(oStates);
                EXPECT_FALSE(oState->mbUsed.exchange(true));
                Rest(nItem);
                oState->mbUsed = false;
                return 1;
            },
            [&](int nOne) { nTaken += nOne; });
        EXPECT_EQ(nTaken, 200);
    }
}

} // namespace krv::threading
